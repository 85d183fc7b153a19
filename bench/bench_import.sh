#!/usr/bin/env bash
# Imports full frames written by the simulator: ERS (28,000 lines x 5,616 samples) as an ERS CEOS
# product and as an ENVISAT-format .E2 file, ENVISAT ASAR (30,000 packets, FBAQ decoded into
# complex floats) as an .N1 file, ALOS PALSAR FBS (28,000 lines x 5,152 samples) as a level 1.0
# product, and prints each import's wall time and peak memory beside plain copies of the same data
# file in the same run, into the same directory (for ASAR also of the written product, eight times
# the bytes of the packets' samples), and the ratios: dd with 8 MB blocks (read into the program and written from it, as the import does) and
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

for case in "ers2 ceos" "ers2 e2" "envisat n1" "alos alos"; do
  read -r preset format <<< "$case"
  echo "== simulating a full $preset frame as $format"
  "$bin/qorvex_simulate" --preset "$preset" --full-frame --format "$format" --no-noise --quiet --config "$config" \
    --out "$dir/frame_$format" > /dev/null
  case $format in
    ceos) input="$dir/frame_ceos"; data="$input/DAT_01.001" ;;
    alos) input="$dir/frame_alos"; data=$(ls "$input"/IMG-HH-*) ;;
    n1) input="$dir/frame_n1.N1"; data=$input ;;
    *) input=$(ls "$dir"/frame_e2.E?); data=$input ;;
  esac
  cat "$data" > /dev/null  # warm in the page cache, as the copy finds it
  read -r dw dr <<< "$(best dd if="$data" of="$dir/out/copy" bs=8M status=none)"
  read -r cw cr <<< "$(best cp "$data" "$dir/out/copy")"
  # Status 1 is an import with warnings (an .E2 file's orbit is propagated from one vector).
  read -r iw ir <<< "$(best sh -c '"$0" --quiet --config "$1" --out "$2" "$3"; [ $? -le 1 ]' "$bin/qorvex-import" "$config" "$dir/out" "$input")"
  size=$(stat -c %s "$data")
  awk -v s="$size" -v dw="$dw" -v cw="$cw" -v iw="$iw" -v ir="$ir" 'BEGIN {
    printf "   data file %.0f MB: import %.3f s (%d MB peak); dd %.3f s, ratio %.2f; cp %.3f s, ratio %.2f\n",
      s / 1048576, iw, ir / 1024, dw, iw / dw, cw, iw / cw }'
  if [ "$format" = n1 ]; then
    product=$(ls "$dir"/out/*_raw | head -1)
    mv "$product" "$dir/product"
    read -r pw pr <<< "$(best dd if="$dir/product" of="$dir/out/copy" bs=8M status=none)"
    read -r qw qr <<< "$(best cp "$dir/product" "$dir/out/copy")"
    awk -v s="$(stat -c %s "$dir/product")" -v pw="$pw" -v qw="$qw" -v iw="$iw" 'BEGIN {
      printf "   written product %.0f MB: dd %.3f s, ratio %.2f; cp %.3f s, ratio %.2f\n", s / 1048576, pw, iw / pw, qw, iw / qw }'
    rm -f "$dir/product"
  fi
  rm -rf "$dir/frame_$format"* "$dir/out"
done
