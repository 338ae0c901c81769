#!/bin/sh
# Installs the build into a fresh temporary prefix and uses it as a client
# would, with nothing of the build tree on any search path:
#   layout   what the prefix holds, `varnel --version`, the library's exports
#   cpp      examples/cpp through find_package(varnel)
#   c        examples/c through pkg-config (needs include/varnel/varnel.h)
#   python   examples/python through the installed package, and through a pip install into a venv
# Exits 77 (skipped) when the part a check needs was not built.
set -eu
part=${1:?usage: check_package.sh layout|cpp|c|python BUILD_DIR SOURCE_DIR VERSION}
build=${2:?}; source=${3:?}; version=${4:?}
unset LD_LIBRARY_PATH PYTHONPATH VARNEL_LIBRARY

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
prefix=$work/prefix
cmake --install "$build" --prefix "$prefix" >"$work/install.log" || { cat "$work/install.log"; exit 1; }

fail() { echo "package: $*"; exit 1; }

# The example prints the meter and at least one reading as "YYYY-MM-DD hh:mm  value".
readings() {
    grep -q 'MVX7001184' "$1" || { cat "$1"; fail "$2 did not print the simulated meter"; }
    grep -Eq '^[0-9]{4}-[0-9]{2}-[0-9]{2} [0-9]{2}:[0-9]{2}  [0-9]+$' "$1" || { cat "$1"; fail "$2 printed no reading"; }
    # The shipped meter's control-solution reading is not glucose.
    ! grep -q '^2008-02-27 06:07  121$' "$1" || fail "$2 printed a control-solution reading as glucose"
    echo "package: $2 printed the meter and $(grep -Ec '^[0-9]{4}-' "$1") readings"
}

case $part in
layout)
    for f in lib/libvarnel.so.0 lib/libvarnel.so lib/varnel/libvantrix32.so.0 include/varnel/dll_wrapper.h \
             lib/varnel/libvarnel_record.so.0 lib/varnel/libvarnel_replay.so.0 include/varnel/vxcapture.h \
             include/varnel/vxsim.h include/varnel/version.h share/varnel/profiles/type7.xml share/varnel/schemas/Datalog.xsd bin/varnel \
             lib/cmake/varnel/varnelConfig.cmake lib/cmake/varnel/varnelConfigVersion.cmake \
             lib/pkgconfig/varnel.pc share/man/man1/varnel.1 share/bash-completion/completions/varnel \
             share/doc/varnel/README.md share/doc/varnel/exports.md share/doc/varnel/LICENSE; do
        [ -e "$prefix/$f" ] || fail "missing $f"
    done
    # The transport is loaded by its versioned name only and stays out of the linker's way.
    [ ! -e "$prefix/lib/varnel/libvantrix32.so" ] || fail "lib/varnel/libvantrix32.so is installed"
    [ ! -e "$prefix/include/vxsim.h" ] || fail "vxsim.h is installed outside include/varnel"
    [ "$("$prefix/bin/varnel" --version)" = "varnel $version" ] || fail "varnel --version does not say $version"
    # The command finds libvarnel and the transport from the prefix alone.
    "$prefix/bin/varnel" discover --quiet >"$work/discover.xml" || fail "varnel discover failed from the prefix"
    grep -q '<TypeID>7</TypeID>' "$work/discover.xml" || fail "varnel discover described no meter"
    # The command finds the installed schemas beside it, and its own document keeps to them.
    "$prefix/bin/varnel" validate "$work/discover.xml" | grep -qx valid || fail "varnel validate did not pass discover's document"
    sh "$source/tests/exports/check_exports.sh" "$prefix/lib/libvarnel.so.0"
    # The manual page covers every command, and the completion offers the commands and a command's options.
    commands=$("$prefix/bin/varnel" --help | sed -n '/^Subcommands:/,/^$/s/^  \([a-z][a-z-]*\) .*/\1/p')
    [ -n "$commands" ] || fail "varnel --help lists no commands"
    for c in $commands; do grep -q "^\.B.* $c\( \|\$\)\|^\.B $c\$" "$prefix/share/man/man1/varnel.1" || fail "the manual page does not describe $c"; done
    completed=$(PATH="$prefix/bin:$PATH" bash -c '. "$1/share/bash-completion/completions/varnel"
        COMP_WORDS=(varnel rea); COMP_CWORD=1; _varnel; echo "${COMPREPLY[*]}"
        COMP_WORDS=(varnel readings --cs); COMP_CWORD=2; _varnel; echo "${COMPREPLY[*]}"' _ "$prefix")
    [ "$completed" = "$(printf 'readings\n--csv')" ] || fail "the bash completion offered: $completed"
    ;;
cpp)
    cmake -S "$source/examples/cpp" -B "$work/cpp" -DCMAKE_PREFIX_PATH="$prefix" \
          -DCMAKE_BUILD_TYPE=Release >"$work/cpp.log" 2>&1 || { cat "$work/cpp.log"; fail "configure failed"; }
    cmake --build "$work/cpp" >>"$work/cpp.log" 2>&1 || { cat "$work/cpp.log"; fail "build failed"; }
    "$work/cpp/readings" >"$work/out" || { cat "$work/out"; fail "the C++ example failed"; }
    readings "$work/out" "the C++ example"
    ;;
c)
    [ -e "$prefix/include/varnel/varnel.h" ] || { echo "package: no C interface installed"; exit 77; }
    export PKG_CONFIG_PATH="$prefix/lib/pkgconfig"
    # Built as the README says: pkg-config's flags alone, their rpath included.
    # shellcheck disable=SC2046
    cc -std=c11 -Wall -Wextra -Werror -o "$work/readings" "$source/examples/c/main.c" $(pkg-config --cflags --libs varnel)
    "$work/readings" >"$work/out" || { cat "$work/out"; fail "the C example failed"; }
    readings "$work/out" "the C example"
    ;;
python)
    packages=$(find "$prefix" -type d -name varnel -path '*-packages/varnel' | head -n 1)
    [ -n "$packages" ] || { echo "package: no Python package installed"; exit 77; }
    command -v python3 >/dev/null || { echo "package: no python3"; exit 77; }
    PYTHONPATH=$(dirname "$packages") python3 "$source/examples/python/readings.py" >"$work/out" ||
        { cat "$work/out"; fail "the Python example failed"; }
    readings "$work/out" "the Python example"
    # pip into a fresh venv, offline, on Debian's python3 with its setuptools and wheel
    # (python3-venv, python3-setuptools, python3-wheel); the package finds libvarnel through VARNEL_LIBRARY.
    py=/usr/bin/python3
    [ -x "$py" ] && "$py" -c 'import venv, setuptools, wheel' 2>/dev/null ||
        { echo "package: no Debian python3 with venv, setuptools and wheel; the pip install is skipped"; exit 0; }
    cp -r "$source/python" "$work/python"  # pip builds inside the tree it is given
    "$py" -m venv --system-site-packages "$work/venv"
    "$work/venv/bin/pip" install --no-build-isolation --no-index --no-cache-dir "$work/python" >"$work/pip.log" 2>&1 ||
        { cat "$work/pip.log"; fail "pip install --no-build-isolation failed"; }
    [ "$("$work/venv/bin/python" -c 'import importlib.metadata as m; print(m.version("varnel"))')" = "$version" ] ||
        fail "the Python package's version is not $version"
    (cd "$work" && VARNEL_LIBRARY="$prefix/lib/libvarnel.so.0" "$work/venv/bin/python" \
        "$source/examples/python/readings.py") >"$work/out" || { cat "$work/out"; fail "the Python example failed in a venv"; }
    readings "$work/out" "the Python example in a venv"
    ;;
*) fail "unknown part $part" ;;
esac
