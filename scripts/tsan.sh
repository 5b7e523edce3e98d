#!/usr/bin/env bash
# The host-thread test (tests/api/test_api_threads.cpp) under ThreadSanitizer:
# builds only the library's parts and that test with clang in build-tsan/ and
# runs it; any report fails. Skips (exit 0) without clang.
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
CXX_BIN="$(command -v clang++-14 || command -v clang++ || true)"
C_BIN="$(command -v clang-14 || command -v clang || true)"
if [ -z "$CXX_BIN" ] || [ -z "$C_BIN" ]; then
  echo "tsan: skipped, clang is not installed"; exit 0
fi
LAUNCHER=()
command -v ccache >/dev/null && LAUNCHER=(-DCMAKE_CXX_COMPILER_LAUNCHER=ccache -DCMAKE_C_COMPILER_LAUNCHER=ccache)
BUILD="$ROOT/build-tsan"
cmake -S "$ROOT" -B "$BUILD" -DCMAKE_C_COMPILER="$C_BIN" -DCMAKE_CXX_COMPILER="$CXX_BIN" "${LAUNCHER[@]}" \
  -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQUORIN_TSAN=ON -DQUORIN_WERROR=ON \
  -DQUORIN_BUILD_BENCH=OFF -DQUORIN_BUILD_APPS=OFF >/dev/null
cmake --build "$BUILD" -j2 --target test_api_threads
TSAN_OPTIONS="halt_on_error=1 second_deadlock_stack=1" "$BUILD/tests/api/test_api_threads"
