#!/usr/bin/env bash
# Installs every Debian 12 package the project needs to build, test, benchmark and run the demo.
# Idempotent; run as root (or with sudo available) on a fresh machine.
set -euo pipefail

packages=(
  build-essential cmake ninja-build pkg-config git
  clang clang-format libclang-rt-14-dev
  libopencv-dev
  libhwy-dev
  ocl-icd-opencl-dev opencl-clhpp-headers opencl-c-headers pocl-opencl-icd
  libgtest-dev libgmock-dev googletest
  libbenchmark-dev
  libopencolorio-dev
  frei0r-plugins-dev
  ffmpeg melt gstreamer1.0-tools gstreamer1.0-plugins-base gstreamer1.0-plugins-good
  gstreamer1.0-plugins-bad
  dpkg-dev file
  libavformat-dev libavcodec-dev libswscale-dev libavutil-dev
  libcli11-dev libutfcpp-dev
  python3-dev pybind11-dev python3-numpy python3-pytest
  util-linux
)

missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q 'install ok installed' || missing+=("$p")
done
if [ ${#missing[@]} -eq 0 ]; then
  echo "setup: all packages present"
  exit 0
fi

sudo_cmd=()
[ "$(id -u)" -eq 0 ] || sudo_cmd=(sudo)
export DEBIAN_FRONTEND=noninteractive
"${sudo_cmd[@]}" apt-get update -q
"${sudo_cmd[@]}" apt-get install -y -q --no-install-recommends "${missing[@]}"
