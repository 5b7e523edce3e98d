#!/usr/bin/env bash
# Cross-builds the library and its tests for 32-bit ARM (armhf) and runs them
# under qemu user emulation. Installs what it needs on Debian bookworm first.
#   bash scripts/armhf.sh                          the portability tests (default)
#   ARMHF_TESTS=. bash scripts/armhf.sh            every test
#   ARMHF_SETUP=0 bash scripts/armhf.sh            skip the installs
# The default set is what differs between targets: the golden blocks of the
# development photos and the net's integer outputs (both written on x86-64),
# the model, container and text readers, the net, the C API and the replays of
# the fuzzers' crash inputs. The JNI library is cross-built too, with the build
# machine's JNI headers (the same for every target); its tests need a JVM.
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
if [ "${ARMHF_SETUP:-1}" = 1 ]; then
  SUDO=""; [ "$(id -u)" -ne 0 ] && SUDO=sudo
  PKGS=(crossbuild-essential-armhf qemu-user qemu-user-binfmt libgtest-dev libboost-dev libeigen3-dev libstb-dev
        openjdk-17-jdk-headless)
  missing=()
  for p in "${PKGS[@]}"; do
    dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
  done
  if ((${#missing[@]})); then
    $SUDO apt-get update || true
    DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y --no-install-recommends "${missing[@]}"
  fi
  # The armhf builds of GoogleTest and Boost through multiarch, where the
  # mirror serves matching versions; without them the build takes Boost's and
  # Eigen's headers (architecture-independent) and builds GoogleTest from
  # /usr/src/googletest with the cross compiler.
  if ! dpkg --print-foreign-architectures | grep -qx armhf; then $SUDO dpkg --add-architecture armhf; $SUDO apt-get update || true; fi
  if ! dpkg-query -W -f='${Status}' libgtest-dev:armhf 2>/dev/null | grep -q "install ok installed"; then
    DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y --no-install-recommends libgtest-dev:armhf libboost-dev:armhf ||
      echo "armhf: multiarch GoogleTest/Boost not installable here; building GoogleTest from source"
  fi
fi
BUILD="$ROOT/build-armhf"
cmake -S "$ROOT" -B "$BUILD" -DCMAKE_TOOLCHAIN_FILE="$ROOT/cmake/armhf-linux-gnueabihf.cmake" \
  -DQUORIN_WERROR=ON -DQUORIN_BUILD_BENCH=OFF
# ctest matches test names (the GoogleTest suites' names) case-sensitively.
TESTS="${ARMHF_TESTS:-[Gg]olden|[Nn]eural|[Mm]odel_?[Rr]eader|[Ii]vb|[Jj]vw|[Jj]son|[Rr]ecords?|[Ss]crambl|[Dd]escramble|[Qq]uorin_?[Aa]pi|[Ff]rame_?[Oo]ps|fuzz_replay}"
if [ "$TESTS" = . ]; then
  cmake --build "$BUILD" -j2
else
  # Build only the programs of the chosen tests.
  targets=(test_golden_blocks test_net_golden test_neural_net test_neural_classifier test_model_reader
           test_ivb_object test_ivb_stream test_jvw_file test_json test_records test_descramble
           test_quorin_api test_frame_ops test_numeric_ivb quorinjni)
  for f in json config cascade_model post_filter_model net_blob net_container jvw quorin_api ivb_unpacker ivb_memory_reader; do
    targets+=("replay_$f")
  done
  cmake --build "$BUILD" -j2 --target "${targets[@]}"
fi
file "$BUILD/tests/faceparts/test_net_golden" | grep -q "ARM" || { echo "armhf: not an ARM build"; exit 1; }
# The JNI library (for an app's jniLibs/armeabi-v7a) links for ARM as well; no
# JVM runs it here.
file -L "$BUILD/java/libquorinjni.so" | grep -q "ARM" || { echo "armhf: libquorinjni.so not built for ARM"; exit 1; }
# Tests of programs outside the chosen set match the pattern too (the IVB
# inspector, the model packer): only the built ones run.
ctest --test-dir "$BUILD" --output-on-failure -j2 -R "$TESTS" -E '_NOT_BUILT$'
