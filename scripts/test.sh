#!/usr/bin/env bash
# Sets up, builds and runs the whole test suite.
#   bash scripts/test.sh              warnings as errors, RelWithDebInfo
#   SANITIZE=1 bash scripts/test.sh   the same under ASan+UBSan (separate build dir)
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
bash "$ROOT/scripts/setup.sh"
[ -x "$ROOT/scripts/fetch-data.sh" ] && bash "$ROOT/scripts/fetch-data.sh"
if [ "${SANITIZE:-0}" = 1 ]; then
  BUILD="$ROOT/build-asan"; EXTRA=(-DQUORIN_SANITIZE=ON -DCMAKE_BUILD_TYPE=Debug -DQUORIN_BUILD_BENCH=OFF)
  export ASAN_OPTIONS=detect_leaks=1:abort_on_error=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1
  # The trackers' long runs take minutes under the sanitizers at 2000 frames;
  # 600 frames still cover slot reuse and the bound after warm-up.
  export QUORIN_LONG_RUN_FRAMES="${QUORIN_LONG_RUN_FRAMES:-600}"
else
  BUILD="$ROOT/build"; EXTRA=()
fi
cmake -S "$ROOT" -B "$BUILD" -DQUORIN_WERROR=ON "${EXTRA[@]}"
cmake --build "$BUILD" -j2
ctest --test-dir "$BUILD" --output-on-failure -j2
