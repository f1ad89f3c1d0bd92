#!/usr/bin/env bash
# Builds the release preset and runs the benchmarks; each prints Mpixel/s and the ratio to a
# memcpy of the same frame measured in the same run.
set -euo pipefail
cd "$(dirname "$0")/.."
cmake --preset release
cmake --build --preset release -j "$(nproc)"
for b in build/release/bin/bench_*; do
  "$b" "$@"
done
