#!/usr/bin/env bash
# Builds midebug and runs the whole test suite three times, in a normal build
# (with the debug adapter's protocol tests), one with AddressSanitizer +
# UndefinedBehaviorSanitizer and one with ThreadSanitizer, then fuzzes the MI
# output parser for a minute.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh

jobs=$(nproc)
run_suite() {
  local dir=$1
  shift
  cmake -S . -B "$dir" -G Ninja "$@" >/dev/null
  cmake --build "$dir" -j "$jobs"
  ctest --test-dir "$dir" --output-on-failure -j "$jobs"
}

echo "== normal build"
run_suite build -DCMAKE_BUILD_TYPE=RelWithDebInfo
echo "== debug adapter, driven by the protocol's client library"
(cd tests/dap && npm ci --no-audit --no-fund --loglevel=error && MIDEBUG_BUILD_DIR="$PWD/../../build" node --test)
echo "== AddressSanitizer + UndefinedBehaviorSanitizer build"
ASAN_OPTIONS=detect_leaks=1:abort_on_error=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
  run_suite build-asan -DCMAKE_BUILD_TYPE=Debug -DMIDEBUG_SANITIZE=asan-ubsan -DMIDEBUG_BENCHMARKS=OFF
echo "== ThreadSanitizer build"
TSAN_OPTIONS=halt_on_error=1:second_deadlock_stack=1 \
  run_suite build-tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DMIDEBUG_SANITIZE=tsan -DMIDEBUG_BENCHMARKS=OFF
echo "== fuzzing the MI output parser and the debug adapter's input"
scripts/fuzz.sh 30
echo "All tests passed."
