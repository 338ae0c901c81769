#!/usr/bin/env bash
# Installs what is missing, builds everything and runs the whole test suite
# (build/); then the same suite built with AddressSanitizer and
# UndefinedBehaviorSanitizer, which stop at the first finding (build-asan/);
# then each fuzz target for a minute (VARNEL_FUZZ_SECONDS) on its seed corpus (build-fuzz/).
# Every stage runs; the command fails when any of them failed.
set -uo pipefail
cd "$(dirname "$0")/.."
jobs="$(nproc)"
failed=()

stage() {
  local name="$1"; shift
  echo "== $name"
  if ! "$@"; then failed+=("$name"); fi
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

if ! bash scripts/build.sh; then
  echo "The build failed." >&2
  exit 1
fi
stage "test suite" suite build
stage "test suite under sanitizers" sanitized
stage "fuzzing" bash scripts/fuzz.sh "${VARNEL_FUZZ_SECONDS:-60}"

if [ ${#failed[@]} -gt 0 ]; then
  echo "Failed: ${failed[*]}" >&2
  exit 1
fi
