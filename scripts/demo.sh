#!/usr/bin/env bash
# Builds midebug and debugs the bundled example program with the real GDB.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
cmake -S . -B build -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build build -j "$(nproc)" --target midebug-demo
mkdir -p build/examples
gcc -g -O0 -o build/examples/hello tools/examples/hello.c
build/tools/midebug-demo build/examples/hello
