#!/usr/bin/env bash
# Installs what is missing, builds midebug and debugs the example program
# end to end with the console debugger and the real GDB: stop at main, step
# over and into, show the call stack, run to the exit.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build build -j "$(nproc)" --target midebug-cli
mkdir -p build/examples
gcc -g -O0 -o build/examples/hello examples/hello/hello.c
build/tools/midebug --batch -x examples/hello/session.txt build/examples/hello
