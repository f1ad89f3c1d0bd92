#!/usr/bin/env bash
# Installs the build into a fresh prefix and uses it as a host developer would, with no
# LD_LIBRARY_PATH: the installed tool, the example host built with CMake and with pkg-config,
# and a project that compiles each umbrella header alone and links both libraries.
# Usage: install_test.sh BUILD_DIR SOURCE_DIR CXX_COMPILER CMAKE_GENERATOR
set -euo pipefail
build=$1
source=$2
cxx=$3
generator=$4

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
unset LD_LIBRARY_PATH TESSAROFX_PLUGIN
prefix=$work/prefix
fail() {
  echo "FAIL: $*" >&2
  exit 1
}

cmake --install "$build" --prefix "$prefix" >/dev/null

# Relative RUNPATHs only: an absolute one would point into the build tree or the staging root.
for f in "$prefix"/bin/tessarofx "$prefix"/lib*/libTessaroFx.so.0 "$prefix"/lib/frei0r-1/*.so; do
  runpath=$(readelf -d "$f" | sed -n 's/.*(RUNPATH).*\[\(.*\)\]/\1/p')
  [[ $runpath == '$ORIGIN'* && $runpath != *:* ]] || fail "$f has RUNPATH '$runpath'"
done

"$prefix/bin/tessarofx" list >"$work/list" || fail "the installed tool cannot list the filters"
grep -q 'ColorAdjust  *18C6E879-4138-42D0-B0B9-6B4401AA97E6' "$work/list" ||
  fail "ColorAdjust is missing from the installed tool's list"

# The frei0r modules load from where the hosts look under the prefix.
FREI0R_PATH=$prefix/lib/frei0r-1 ffmpeg -nostdin -v error -f lavfi -i testsrc2=s=32x16 \
  -frames:v 1 -vf frei0r=tessarofx-coloradjust:0.7 -f null - ||
  fail "ffmpeg cannot run an installed frei0r module"

pcdir=$(dirname "$(find "$prefix" -name tessarofx.pc)")
export PKG_CONFIG_PATH=$pcdir
ls "$(pkg-config --variable=kerneldir tessarofx)"/*.cl >/dev/null || fail "no kernels at kerneldir"

# The example's first pixel is (40, 40, 40, 255); exposure +50 must brighten it.
check_example() {
  local out
  out=$("$1" 2>/dev/null) || fail "$1 failed"
  grep -q ColorAdjust <<<"$out" || fail "$1 did not list ColorAdjust"
  local blue
  blue=$(awk '/^BGRA/ {print $7; exit}' <<<"$out")
  [[ -n $blue && $blue -gt 40 ]] || fail "$1 did not brighten the first pixel: $out"
}

cmake -S "$source/examples/host" -B "$work/cmake" -G "$generator" -DCMAKE_PREFIX_PATH="$prefix" \
  -DCMAKE_CXX_COMPILER="$cxx" >/dev/null
cmake --build "$work/cmake" >/dev/null
check_example "$work/cmake/host_example"

cp -r "$source/examples/host" "$work/make"
make -s -C "$work/make" CXX="$cxx" >/dev/null
check_example "$work/make/host_example"

cmake -S "$source/tests/install/consumer" -B "$work/consumer" -G "$generator" \
  -DCMAKE_PREFIX_PATH="$prefix" -DCMAKE_CXX_COMPILER="$cxx" >/dev/null
cmake --build "$work/consumer" >/dev/null
"$work/consumer/consumer" || fail "the consumer of both libraries failed"
echo "install ok"
