#!/bin/sh
# The differential: the Linux client's output and the Windows client's under Wine, byte for byte.
#   compare.sh LINUX_CLIENT WINE_RUN WINDOWS_CLIENT WORK_DIR
set -u
linux=$1 run=$2 windows=$3 work=$4
mkdir -p "$work"
"$linux" >"$work/linux.txt" 2>"$work/linux.err" || { echo "the Linux client failed"; cat "$work/linux.err"; exit 1; }
"$run" "$windows" >"$work/windows.txt" 2>"$work/windows.err" || { echo "the Windows client failed"; cat "$work/windows.err"; exit 1; }
if ! cmp -s "$work/linux.txt" "$work/windows.txt"; then
    diff "$work/linux.txt" "$work/windows.txt" | head -n 40
    exit 1
fi
echo "same output: $(wc -c <"$work/linux.txt") bytes, $(cat "$work/linux.err")"
