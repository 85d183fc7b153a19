#!/usr/bin/env bash
# Imports a full ERS frame (28,000 lines x 5,616 samples) written by the simulator as an ERS CEOS
# product and as an ENVISAT-format .E2 file, and prints each import's wall time and peak memory
# beside plain copies of the same data file in the same run, into the same directory, and the
# ratios: dd with 8 MB blocks (read into the program and written from it, as the import does) and
# cp (which has the kernel copy the file, copy_file_range, without passing it through the program). Best of QORVEX_BENCH_ROUNDS runs (3) each, the input warm in the page cache, and
# a scratch file written and deleted before each run so that the output goes into memory the
# machine has used before (see bench_chain.sh).
#
#   bench/bench_import.sh [build/bin]        (scratch files under $TMPDIR, about 2 GB, removed at the end)
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
bin=$(cd "${1:-$top/build/bin}" && pwd)
dir=$(mktemp -d "${TMPDIR:-/tmp}/qorvex-bench-import-XXXXXX")
trap 'rm -rf "$dir"' EXIT
rounds=${QORVEX_BENCH_ROUNDS:-3}
config=$(cd "$bin/../etc" && pwd)

warm() {
  [ "${QORVEX_BENCH_COLD:-0}" = 1 ] && return 0
  dd if=/dev/zero of="$dir/warm" bs=1M count=1000 status=none && rm -f "$dir/warm"
}

# best COMMAND...: the fastest wall time (s, from the shell's microsecond clock) and the peak
# memory (kB) of that run, over the rounds, the output removed before each run.
best() {
  local wall="" rss="" t0 t1 w
  for _ in $(seq "$rounds"); do
    rm -rf "$dir/out" && mkdir -p "$dir/out"
    warm
    t0=$EPOCHREALTIME
    /usr/bin/time -f '%M' -o "$dir/time.txt" "$@" > "$dir/run.txt" 2>&1 || { cat "$dir/run.txt" >&2; exit 1; }
    t1=$EPOCHREALTIME
    w=$(awk -v a="$t0" -v b="$t1" 'BEGIN { printf "%.4f", b - a }')
    if [ -z "$wall" ] || awk -v a="$w" -v b="$wall" 'BEGIN { exit !(a < b) }'; then wall=$w; rss=$(cat "$dir/time.txt"); fi
  done
  echo "$wall $rss"
}

for format in ceos e2; do
  echo "== simulating a full ERS frame as $format"
  "$bin/qorvex_simulate" --preset ers2 --full-frame --format "$format" --no-noise --quiet --config "$config" \
    --out "$dir/frame_$format" > /dev/null
  if [ "$format" = ceos ]; then input="$dir/frame_ceos"; data="$input/DAT_01.001"; else input=$(ls "$dir"/frame_e2.E?); data=$input; fi
  cat "$data" > /dev/null  # warm in the page cache, as the copy finds it
  read -r dw dr <<< "$(best dd if="$data" of="$dir/out/copy" bs=8M status=none)"
  read -r cw cr <<< "$(best cp "$data" "$dir/out/copy")"
  # The import of an ENVISAT-format file ends with status 1: its orbit is propagated from one vector.
  read -r iw ir <<< "$(best sh -c '"$0" --quiet --config "$1" --out "$2" "$3"; [ $? -le 1 ]' "$bin/qorvex-import" "$config" "$dir/out" "$input")"
  size=$(stat -c %s "$data")
  awk -v s="$size" -v dw="$dw" -v cw="$cw" -v iw="$iw" -v ir="$ir" 'BEGIN {
    printf "   data file %.0f MB: import %.3f s (%d MB peak); dd %.3f s, ratio %.2f; cp %.3f s, ratio %.2f\n",
      s / 1048576, iw, ir / 1024, dw, iw / dw, cw, iw / cw }'
  rm -rf "$dir/frame_$format"*
done
