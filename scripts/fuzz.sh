#!/usr/bin/env bash
# Builds the IVB fuzz targets with clang's libFuzzer (ASan+UBSan) and runs each
# for a bounded time from the golden seeds.
#   bash scripts/fuzz.sh                 30 s per target
#   FUZZ_SECONDS=600 bash scripts/fuzz.sh
# Skips (exit 0) when clang or libFuzzer is not installed.
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
SECONDS_PER_TARGET="${FUZZ_SECONDS:-30}"
CXX_BIN="$(command -v clang++-14 || command -v clang++ || true)"
C_BIN="$(command -v clang-14 || command -v clang || true)"
if [ -z "$CXX_BIN" ] || [ -z "$C_BIN" ]; then
  echo "fuzz: skipped, clang is not installed"; exit 0
fi
if ! echo 'extern "C" int LLVMFuzzerTestOneInput(const unsigned char*, unsigned long){return 0;}' |
    "$CXX_BIN" -x c++ -fsanitize=fuzzer - -o /dev/null 2>/dev/null; then
  echo "fuzz: skipped, libFuzzer is not available to $CXX_BIN"; exit 0
fi
BUILD="$ROOT/build-fuzz"
cmake -S "$ROOT" -B "$BUILD" -DCMAKE_C_COMPILER="$C_BIN" -DCMAKE_CXX_COMPILER="$CXX_BIN" \
  -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQUORIN_FUZZ=ON -DQUORIN_WERROR=ON \
  -DQUORIN_BUILD_TESTS=OFF -DQUORIN_BUILD_BENCH=OFF -DQUORIN_BUILD_APPS=OFF >/dev/null
cmake --build "$BUILD" -j2 --target fuzz_ivb_unpacker fuzz_ivb_memory_reader ivb_fuzz_seeds
SEEDS="$BUILD/seeds"
rm -rf "$SEEDS"; mkdir -p "$SEEDS/objects" "$SEEDS/streams"
"$BUILD/tests/fuzz/ivb_fuzz_seeds" "$SEEDS/objects" "$SEEDS/streams"
export ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1
status=0
for pair in ivb_unpacker:objects ivb_memory_reader:streams; do
  target="${pair%%:*}"; seeds="${pair##*:}"
  corpus="$BUILD/corpus/$target"; mkdir -p "$corpus"
  echo "fuzz: $target for ${SECONDS_PER_TARGET}s"
  if ! (cd "$BUILD" && "$BUILD/tests/fuzz/fuzz_$target" -max_total_time="$SECONDS_PER_TARGET" \
        -rss_limit_mb=2048 -max_len=4096 -print_final_stats=1 "$corpus" "$SEEDS/$seeds" 2>"$BUILD/$target.log"); then
    echo "fuzz: $target FAILED, see $BUILD/$target.log"; tail -40 "$BUILD/$target.log"; status=1
  else
    grep -E "stat::number_of_executed_units|Done [0-9]+ runs" "$BUILD/$target.log" | tail -2
  fi
done
exit $status
