#!/usr/bin/env bash
# Sets the machine up, builds the release preset and runs the demo: every implemented filter
# applied to the bundled sample scene, one PNG per filter plus a before/after contact sheet.
# Usage: scripts/demo.sh [OUTDIR]   (default: demo-out)
set -euo pipefail
cd "$(dirname "$0")/.."

bash scripts/setup.sh
cmake --preset release
cmake --build --preset release -j "$(nproc)" --target tessarofx
./build/release/bin/tessarofx demo "${1:-demo-out}"
