#!/usr/bin/env bash
# Builds the libFuzzer targets with clang under AddressSanitizer +
# UndefinedBehaviorSanitizer and runs each for a while (default 60 seconds):
# the parser's on the committed seeds and the recorded debugger transcripts,
# the debug adapter's on its seeds. A crash, hang or leak fails the run; keep
# its input under tests/fuzz/regressions/ (tests/fuzz/dap/regressions/).
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
seconds=${1:-60}

CC=clang CXX=clang++ cmake -S . -B build-fuzz -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DMIDEBUG_SANITIZE=asan-ubsan -DMIDEBUG_FUZZ=ON -DMIDEBUG_BENCHMARKS=OFF -DBUILD_TESTING=OFF >/dev/null
cmake --build build-fuzz -j "$(nproc)" --target gdboutput_fuzz dap_fuzz

corpus=$(mktemp -d)
trap 'rm -rf "$corpus"' EXIT
cp tests/fuzz/seeds/* tests/fuzz/regressions/* "$corpus"/ 2>/dev/null || true
for transcript in tests/data/transcripts/*.mi; do
  [ -e "$transcript" ] || continue
  # A waiting result for every token, of a command chosen by the first byte.
  { printf '\x07\x00'; cat "$transcript"; } > "$corpus/$(basename "$transcript")"
done
mkdir -p build-fuzz/findings
ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
  build-fuzz/tests/fuzz/gdboutput_fuzz -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
  -max_len=65536 -print_final_stats=1 -artifact_prefix=build-fuzz/findings/ "$corpus"

dapcorpus=$(mktemp -d)
trap 'rm -rf "$corpus" "$dapcorpus"' EXIT
cp tests/fuzz/dap/seeds/* tests/fuzz/dap/regressions/* "$dapcorpus"/ 2>/dev/null || true
ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
  build-fuzz/tests/fuzz/dap_fuzz -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 \
  -max_len=65536 -print_final_stats=1 -artifact_prefix=build-fuzz/findings/ "$dapcorpus"
