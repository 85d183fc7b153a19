#!/usr/bin/env bash
# Builds the libFuzzer harnesses with clang (AddressSanitizer and UndefinedBehaviorSanitizer) into
# build-fuzz/ and runs each for a given time on a corpus seeded from the project's own files.
# Usage: tests/fuzz/run_fuzzers.sh SECONDS [harness ...]   (harnesses: xml_header text_header
#        key_file arguments json native_archive raw_lines asar_archive alos_archive; all when none
#        is named). Exit status 1 when a
#        harness found a crash.
# Environment: QORVEX_FUZZ_JOBS (default 1) parallel jobs per harness; QORVEX_FUZZ_NICE (default 19).
set -euo pipefail
top=$(cd "$(dirname "$0")/../.." && pwd)
seconds=${1:?usage: run_fuzzers.sh SECONDS [harness ...]}
shift
harnesses=("$@")
[ ${#harnesses[@]} -gt 0 ] || harnesses=(xml_header text_header key_file arguments json native_archive raw_lines asar_archive alos_archive)
build="$top/build-fuzz"
jobs=${QORVEX_FUZZ_JOBS:-1}

if [ ! -f "$build/CMakeCache.txt" ]; then
  generator=()
  command -v ninja >/dev/null && generator=(-G Ninja)
  launcher=()
  command -v ccache >/dev/null && launcher=(-DCMAKE_CXX_COMPILER_LAUNCHER=ccache -DCMAKE_C_COMPILER_LAUNCHER=ccache)
  CC=clang CXX=clang++ cmake -S "$top" -B "$build" "${generator[@]}" "${launcher[@]}" -DCMAKE_BUILD_TYPE=Debug \
    -DCMAKE_CXX_FLAGS="-O1 -g -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-recover=undefined" \
    -DCMAKE_C_FLAGS="-O1 -g -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-recover=undefined" \
    -DCMAKE_EXE_LINKER_FLAGS="-fsanitize=address,undefined" \
    -DQORVEX_BUILD_TESTS=OFF -DQORVEX_BUILD_BENCH=OFF -DQORVEX_BUILD_FUZZ=ON >/dev/null
fi
targets=()
for h in "${harnesses[@]}"; do targets+=("fuzz_$h"); done
cmake --build "$build" -j "$(nproc)" --target "${targets[@]}"

# Seeds: the project's own headers, key and mandatory files, arguments and JSON examples;
# the harnesses of the importers and raw_lines write their own (simulated archives, small rasters)
# into the corpus at start-up.
seeds() {
  case "$1" in
    xml_header) ls "$top"/tests/store/golden/*.sml "$top"/tests/fuzz/seeds/xml_header/* ;;
    text_header) ls "$top"/tests/store/golden/*_hdr ;;
    key_file) ls "$top"/share/qorvex/keys/*.key "$top"/tests/store/keys/*.key "$top"/share/qorvex/mandatory/* ;;
    arguments) ls "$top"/tests/fuzz/seeds/arguments/* ;;
    json) ls "$top"/tests/fuzz/seeds/json/* ;;
  esac
}

status=0
for h in "${harnesses[@]}"; do
  corpus="$build/corpus/$h"
  artifacts="$build/artifacts/$h/"
  mkdir -p "$corpus" "$artifacts"
  for f in $(seeds "$h"); do cp -n "$f" "$corpus/" 2>/dev/null || true; done
  dict=()
  [ "$h" = xml_header ] && dict=(-dict="$top/tests/fuzz/xml.dict")
  seed_env=()
  case "$h" in native_archive | raw_lines | asar_archive | alos_archive) seed_env=(QORVEX_FUZZ_SEEDS="$corpus") ;; esac
  log="$build/fuzz_$h.log"
  before=$(ls "$artifacts" | wc -l)
  echo "fuzz: $h for ${seconds} s (log $log)"
  parallel=()
  [ "$jobs" -gt 1 ] && parallel=(-jobs="$jobs" -workers="$jobs")
  set +e
  (cd "$build" && env "${seed_env[@]}" nice -n "${QORVEX_FUZZ_NICE:-19}" "$build/fuzz/fuzz_$h" "$corpus" "${dict[@]}" "${parallel[@]}" \
    -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 -malloc_limit_mb=1024 -max_len=65536 \
    -print_final_stats=1 -artifact_prefix="$artifacts") > "$log" 2>&1
  rc=$?
  set -e
  if [ "$jobs" -gt 1 ]; then cat "$build"/fuzz-*.log >> "$log" 2>/dev/null || true; rm -f "$build"/fuzz-*.log; fi
  runs=$(grep -h "stat::number_of_executed_units" "$log" | awk '{s += $2} END {print s + 0}')
  echo "fuzz: $h: $runs executions, exit $rc"
  if [ $rc -ne 0 ] || [ "$(ls "$artifacts" | wc -l)" -ne "$before" ]; then
    echo "fuzz: $h FOUND A FAULT: see $log and $artifacts"
    grep -h -A20 "ERROR:\|==ERROR\|runtime error\|abort" "$log" | head -40 || true
    status=1
  fi
done
exit $status
