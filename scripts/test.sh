#!/usr/bin/env bash
# Sets the machine up, then builds and runs every test: a format check, the release build with
# its unit, stress and tool tests, the same suite under AddressSanitizer +
# UndefinedBehaviorSanitizer, the frame-parallel stress test under ThreadSanitizer, and each
# libFuzzer target over its corpus and then for a bounded time.
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

echo "== stress test under ThreadSanitizer"
cmake --preset tsan
cmake --build --preset tsan -j "$jobs"
ctest --preset tsan

echo "== fuzz (clang, libFuzzer, ASan + UBSan): the tool and the bridges build with clang too; each fuzzer replays its corpus, then runs for 30 s"
cmake --preset fuzz
cmake --build --preset fuzz -j "$jobs"
mkdir -p build/fuzz/artifacts
# New inputs go to scratch copies of the corpora, so the checkout stays as it is.
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
fuzz() {
  local target=$1
  local fuzzer=build/fuzz/bin/${target}_fuzz
  "$fuzzer" -runs=0 -rss_limit_mb=4096 -artifact_prefix="build/fuzz/artifacts/$target-" fuzz/corpus/"$target" \
    >"$scratch/$target-replay.log" 2>&1 || { tail -n 80 "$scratch/$target-replay.log"; return 1; }
  mkdir "$scratch/$target"
  cp fuzz/corpus/"$target"/* "$scratch/$target"/
  "$fuzzer" -max_total_time=30 -timeout=20 -rss_limit_mb=4096 -print_final_stats=1 \
    -artifact_prefix="build/fuzz/artifacts/$target-" "$scratch/$target" \
    >"$scratch/$target.log" 2>&1 || { tail -n 80 "$scratch/$target.log"; return 1; }
  echo "$target: replayed $(ls fuzz/corpus/"$target" | wc -l) inputs, clean; then" \
    "$(grep -E '^Done [0-9]+ runs' "$scratch/$target.log"), no crash;" \
    "$(grep -E '^#[0-9]+[[:space:]]+DONE' "$scratch/$target.log" | grep -oE 'cov: [0-9]+ ft: [0-9]+')"
}
# Two at a time, one a core.
status=0
fuzz CubeLutLoad & first=$!
fuzz PluginFrames || status=1
wait "$first" || status=1
fuzz ImageFunctions || status=1
exit "$status"
