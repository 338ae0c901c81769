#!/usr/bin/env bash
# The test command. Installs what is missing, builds everything into build/
# and runs the whole suite there (fault sweep, command, packaging, schemas and
# capture tests included).
#
# --all adds what CI runs: the benchmark program (run once by the suite), the
# same suite built with AddressSanitizer and UndefinedBehaviorSanitizer
# (build-asan/), two components on two threads under ThreadSanitizer
# (build-tsan/, scripts/tsan.sh), each fuzz target for a minute (VARNEL_FUZZ_SECONDS) on its
# seed corpus (build-fuzz/), the API reference with every doxygen warning an
# error, and every further stage found in scripts/ (the Windows cross build
# under Wine). Every stage runs; the command fails when any
# of them failed.
set -uo pipefail
cd "$(dirname "$0")/.."
jobs="$(nproc)"
all=0
case "${1:-}" in
  "") ;;
  --all) all=1 ;;
  *) echo "usage: bash scripts/test.sh [--all]" >&2; exit 64 ;;
esac
failed=()

stage() {
  local name="$1"; shift
  echo "== $name"
  local start=$SECONDS
  if ! "$@"; then failed+=("$name"); fi
  echo "== $name: $((SECONDS - start)) s"
}

suite() {
  (cd "$1" && ctest --output-on-failure --timeout 900 -j"$jobs")
}

sanitized() {
  cmake -S . -B build-asan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVARNEL_WERROR=ON \
        -DVARNEL_SANITIZE=address,undefined >/dev/null &&
    cmake --build build-asan -j"$jobs" >&2 &&
    ASAN_OPTIONS=detect_leaks=1:abort_on_error=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
      suite build-asan
}

if ! VARNEL_BENCH=$all bash scripts/build.sh; then
  echo "The build failed." >&2
  exit 1
fi
stage "test suite" suite build
if [ $all = 1 ]; then
  stage "test suite under sanitizers" sanitized
  stage "threads under ThreadSanitizer" bash scripts/tsan.sh
  stage "fuzzing" bash scripts/fuzz.sh "${VARNEL_FUZZ_SECONDS:-60}"
  stage "API reference" bash scripts/docs.sh
  [ -f scripts/windows.sh ] && stage "Windows" bash scripts/windows.sh
fi

if [ ${#failed[@]} -gt 0 ]; then
  echo "Failed: ${failed[*]}" >&2
  exit 1
fi
echo "All stages passed."
