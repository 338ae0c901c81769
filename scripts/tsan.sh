#!/usr/bin/env bash
# ThreadSanitizer stage (run by `scripts/test.sh --all`): builds the thread
# programs with -fsanitize=thread into build-tsan/ and runs two components on
# two threads for a few hundred sessions (C++ and the C interface, two meter
# types on their own clocks, then both on one simulated meter, each session
# compared with a one-thread run), plus the suite's other tests that use threads.
# Stops at the first report.
set -euo pipefail
cd "$(dirname "$0")/.."
sessions="${VARNEL_THREAD_SESSIONS:-150}"
cmake -S . -B build-tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DVARNEL_WERROR=ON -DVARNEL_SANITIZE=thread >/dev/null
cmake --build build-tsan -j"$(nproc)" --target vantrix32 test_component test_units >&2
export TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1"
VARNEL_THREAD_SESSIONS=$sessions build-tsan/bin/test_component --gtest_filter='Threads.*'
build-tsan/bin/test_units --gtest_filter='ContinueFlag.*:WaitTimerTest.*'
