#!/usr/bin/env bash
# Builds the libFuzzer targets (clang, ASan+UBSan) and runs each for a bounded
# time, from seed corpora made fresh out of models/ (and, when the data cache
# is there, one development photo). Prints one summary line per target:
# executions, executions per second, and whether it found a crash.
#   bash scripts/fuzz.sh                      30 s per target, every target
#   FUZZ_SECONDS=300 bash scripts/fuzz.sh     a campaign of 5 min per target
#   FUZZ_TARGETS="json net_blob" bash scripts/fuzz.sh
#   FUZZ_JOBS=2 bash scripts/fuzz.sh          two targets at a time
#   FUZZ_SEED=1 bash scripts/fuzz.sh          a fixed random seed (CI), so that
#                                             a run's result follows the commit
# Crashing inputs land in build-fuzz/findings/<target>/; copy each into
# tests/fuzz/regressions/<target>/ once fixed, where the fuzz regression test
# replays it on every run of the suite. Skips (exit 0) without clang/libFuzzer.
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
SECONDS_PER_TARGET="${FUZZ_SECONDS:-30}"
JOBS="${FUZZ_JOBS:-1}"
SEED_ARG=()
[ -n "${FUZZ_SEED:-}" ] && SEED_ARG=(-seed="$FUZZ_SEED")
CXX_BIN="$(command -v clang++-14 || command -v clang++ || true)"
C_BIN="$(command -v clang-14 || command -v clang || true)"
if [ -z "$CXX_BIN" ] || [ -z "$C_BIN" ]; then
  echo "fuzz: skipped, clang is not installed"; exit 0
fi
if ! echo 'extern "C" int LLVMFuzzerTestOneInput(const unsigned char*, unsigned long){return 0;}' |
    "$CXX_BIN" -x c++ -fsanitize=fuzzer - -o /dev/null 2>/dev/null; then
  echo "fuzz: skipped, libFuzzer is not available to $CXX_BIN"; exit 0
fi
ALL_TARGETS=(json config cascade_model post_filter_model net_blob net_container jvw quorin_api
             ivb_unpacker ivb_memory_reader)
read -r -a TARGETS <<< "${FUZZ_TARGETS:-${ALL_TARGETS[*]}}"
BUILD="$ROOT/build-fuzz"
cmake -S "$ROOT" -B "$BUILD" -DCMAKE_C_COMPILER="$C_BIN" -DCMAKE_CXX_COMPILER="$CXX_BIN" \
  -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQUORIN_FUZZ=ON -DQUORIN_WERROR=ON \
  -DQUORIN_BUILD_TESTS=OFF -DQUORIN_BUILD_BENCH=OFF -DQUORIN_BUILD_APPS=OFF >/dev/null
cmake --build "$BUILD" -j2 --target fuzz_seeds "${TARGETS[@]/#/fuzz_}"

SEEDS="$BUILD/seeds"
rm -rf "$SEEDS"; mkdir -p "$SEEDS"
PHOTO="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}/photos/tracking_faces.jpg"
[ -f "$PHOTO" ] || PHOTO=""
"$BUILD/tests/fuzz/fuzz_seeds" "$ROOT/models" "$SEEDS" $PHOTO

export ASAN_OPTIONS=detect_leaks=1:allocator_may_return_null=1
export UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1

# Inputs longer than the largest seed are seldom worth their time; the model
# targets start from whole built-in models and keep that room.
max_len() {
  case "$1" in
    cascade_model|net_blob|net_container|post_filter_model) echo 400000 ;;
    quorin_api) echo 45000 ;;
    *) echo 4096 ;;
  esac
}

run_one() {
  local target="$1"
  local corpus="$BUILD/corpus/$target" findings="$BUILD/findings/$target" log="$BUILD/$target.log"
  mkdir -p "$corpus" "$findings"
  local seeds="$SEEDS/$target"; mkdir -p "$seeds"
  local rc=0
  (cd "$BUILD" && "$BUILD/tests/fuzz/fuzz_$target" -max_total_time="$SECONDS_PER_TARGET" \
     -rss_limit_mb=2048 -malloc_limit_mb=1024 -timeout=25 -max_len="$(max_len "$target")" \
     -artifact_prefix="$findings/" -print_final_stats=1 "${SEED_ARG[@]}" "$corpus" "$seeds") >"$log" 2>&1 || rc=$?
  local runs speed
  runs="$(grep -E "stat::number_of_executed_units" "$log" | tail -1 | awk '{print $2}')"
  speed="$(grep -E "stat::average_exec_per_sec" "$log" | tail -1 | awk '{print $2}')"
  if [ "$rc" -eq 0 ]; then
    echo "fuzz: $target ok: ${runs:-?} runs in ${SECONDS_PER_TARGET}s (${speed:-?}/s), corpus $(ls "$corpus" | wc -l)"
  else
    echo "fuzz: $target FAILED after ${runs:-?} runs: $(ls "$findings" | tr '\n' ' ') (log $log)"
    grep -E "ERROR|SUMMARY|runtime error" "$log" | head -5
  fi
  return $rc
}

status=0
if [ "$JOBS" -le 1 ]; then
  for t in "${TARGETS[@]}"; do run_one "$t" || status=1; done
else
  pids=()
  for t in "${TARGETS[@]}"; do
    while [ "$(jobs -rp | wc -l)" -ge "$JOBS" ]; do wait -n || status=1; done
    run_one "$t" & pids+=($!)
  done
  for p in "${pids[@]}"; do wait "$p" || status=1; done
fi
exit $status
