#!/usr/bin/env bash
# Installs everything the build, the tests, the tools and the benchmarks need
# on a Debian bookworm machine. Safe to run repeatedly.
set -euo pipefail
PKGS=(
  build-essential cmake pkg-config binutils python3 python3-numpy
  libgtest-dev libgmock-dev libbenchmark-dev
  libeigen3-dev libboost-dev
  libstb-dev
  opencv-data python3-opencv libopencv-objdetect-dev libopencv-imgproc-dev libopencv-imgcodecs-dev
  libdlib-dev libdlib-data
  ffmpeg nodejs npm opencv-doc
  clang-14 libclang-rt-14-dev
  openjdk-17-jdk-headless junit5
)
missing=()
for p in "${PKGS[@]}"; do
  # A nodejs that bundles npm (as the NodeSource build does) conflicts with Debian's npm.
  [ "$p" = npm ] && command -v npm >/dev/null && continue
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if ((${#missing[@]})); then
  SUDO=""; [ "$(id -u)" -ne 0 ] && SUDO=sudo
  $SUDO apt-get update
  DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y --no-install-recommends "${missing[@]}"
fi
