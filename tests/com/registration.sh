#!/bin/sh
# regsvr32 and what it leaves in the registry, read back with `reg query`.
#   registration.sh register WINE_RUN IDL_DIR DLL...    registers; every ProgID names an Apartment class of its DLL
#   registration.sh unregister WINE_RUN IDL_DIR DLL...  unregisters; no key of any identifier or ProgID is left
set -u
mode=$1 run=$2 idl=$3
shift 3
progids="Varnel.DllWrapper Varnel.UniqueChecker Varnel.XMLWrapper"
fail=0
for dll in "$@"; do
    if [ "$mode" = register ]; then
        "$run" regsvr32 /s "$dll" || { echo "regsvr32 $dll failed"; fail=1; }
    else
        "$run" regsvr32 /s /u "$dll" || { echo "regsvr32 /u $dll failed"; fail=1; }
    fi
done
query() { "$run" reg query "$1" ${2:+/v "$2"} 2>/dev/null | tr -d '\r'; }
if [ "$mode" = register ]; then
    for p in $progids; do
        clsid=$(query "HKCR\\$p\\CLSID" | sed -n 's/.*REG_SZ *//p' | head -n 1)
        [ -n "$clsid" ] || { echo "$p: no CLSID"; fail=1; continue; }
        query "HKCR\\CLSID\\$clsid\\InprocServer32" ThreadingModel | grep -q 'REG_SZ *Apartment' ||
            { echo "$p: $clsid is not an Apartment in-process server"; fail=1; }
        query "HKCR\\CLSID\\$clsid\\TypeLib" >/dev/null || { echo "$p: no TypeLib"; fail=1; }
    done
    exit $fail
fi
# Every identifier of both type libraries, and the ProgIDs: none may remain.
uuids=$(sed -n 's/.*uuid(\([0-9a-fA-F-]*\)).*/\1/p' "$idl"/*.idl)
[ -n "$uuids" ] || { echo "no identifiers found in $idl"; exit 1; }
for hive in CLSID Interface TypeLib; do
    keys=$(query "HKCR\\$hive")
    [ -n "$keys" ] || { echo "cannot list HKCR\\$hive"; fail=1; }
    for u in $uuids; do
        if printf '%s\n' "$keys" | grep -qi "\\{$u}\$"; then echo "left behind: HKCR\\$hive\\{$u}"; fail=1; fi
    done
done
for p in $progids; do
    if "$run" reg query "HKCR\\$p" >/dev/null 2>&1; then echo "left behind: HKCR\\$p"; fail=1; fi
done
exit $fail
