#!/usr/bin/env bash
# Sets the machine up, then builds and runs every test: a format check, the release build with
# its unit and tool tests, and the same suite under AddressSanitizer + UndefinedBehaviorSanitizer.
set -euo pipefail
cd "$(dirname "$0")/.."

bash scripts/setup.sh

echo "== format check"
git ls-files -z -- '*.h' '*.cpp' | xargs -0 -r clang-format --dry-run --Werror

jobs=$(nproc)

echo "== release build and tests"
cmake --preset release
cmake --build --preset release -j "$jobs"
ctest --preset release -j "$jobs"

echo "== sanitizer build and tests (ASan + UBSan)"
cmake --preset asan-ubsan
cmake --build --preset asan-ubsan -j "$jobs"
ctest --preset asan-ubsan -j "$jobs"
