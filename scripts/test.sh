#!/usr/bin/env bash
# Sets the machine up, then builds and runs every test: a format check, the release build with
# its unit and tool tests, the same suite under AddressSanitizer + UndefinedBehaviorSanitizer, and
# the LUT reader's fuzz target over its corpus and then for a bounded time.
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

echo "== fuzz: LUT files (libFuzzer, ASan + UBSan; corpus replay, then 30 s)"
cmake --preset fuzz
cmake --build --preset fuzz -j "$jobs"
fuzzer=build/fuzz/bin/CubeLutLoad_fuzz
mkdir -p build/fuzz/artifacts
"$fuzzer" -artifact_prefix=build/fuzz/artifacts/ fuzz/corpus/*
# New inputs go to a scratch copy of the corpus, so the checkout stays as it is.
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
cp fuzz/corpus/* "$scratch"/
"$fuzzer" -max_total_time=30 -timeout=10 -print_final_stats=1 \
  -artifact_prefix=build/fuzz/artifacts/ "$scratch"
