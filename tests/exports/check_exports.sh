#!/bin/sh
# Fails when the shared library exports anything beyond the public API of
# include/varnel: internal classes, implementation structs, standard-library
# template instances.
set -eu
lib=${1:?usage: check_exports.sh LIBRARY}
public='Clock|ManualClock|ComponentError|DllWrapper|UniqueChecker|XMLWrapper'
functions='threadClock|setThreadClock|returnCodeText|readDatalog|isGlucoseKind|numberIn|inUnit|readingNotes|readingsCsv|readingsJson'
# The C interface: every function varnel.h declares.
header=$(dirname "$0")/../../include/varnel/varnel.h
c_functions=$(sed -n 's/^VARNEL_API [^(]*[ *]\(varnel_[a-z_]*\)(.*/\1/p' "$header" | paste -sd'|' -)
[ -n "$c_functions" ] || { echo "exports: no function found in $header"; exit 1; }

symbols=$(nm -DC --defined-only "$lib" | sed 's/^[0-9a-fA-F]* [A-Za-z] //')
[ -n "$symbols" ] || { echo "exports: $lib exports nothing"; exit 1; }

outside=$(printf '%s\n' "$symbols" | grep -Ev \
    -e "^varnel::($public)::[A-Za-z_~]" \
    -e "^varnel::($functions)(\[abi:cxx11\])?\(" \
    -e "^(typeinfo|typeinfo name|vtable) for varnel::($public)$" \
    -e "^($c_functions)$" || true)
# Names of implementation structs, internals and private members; an implementation struct
# also as a parameter type (a private constructor taking it).
hidden=$(printf '%s\n' "$symbols" | grep -E '^[^(]*(::Impl\b|varnel::detail::|::edit\(|::view\()|::Impl\b' || true)

missing=$(printf '%s\n' "$c_functions" | tr '|' '\n' | while read -r f; do
    printf '%s\n' "$symbols" | grep -qx "$f" || echo "$f"
done)
if [ -n "$missing" ]; then
    echo "exports: $lib lacks C functions of varnel.h:"
    printf '%s\n' "$missing"
    exit 1
fi

if [ -n "$outside$hidden" ]; then
    echo "exports: $lib exports names outside the public API:"
    printf '%s\n' "$outside" "$hidden" | sed '/^$/d' | sort -u
    exit 1
fi
echo "exports: $(printf '%s\n' "$symbols" | wc -l) public names, nothing else"
