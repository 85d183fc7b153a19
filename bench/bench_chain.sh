#!/usr/bin/env bash
# Focuses a full ERS frame (28,000 lines x 5,616 samples, 300 targets) through the driver: parameters,
# range compression and omega-k focusing (steps 0, 2 and 5), on one thread and on two. For each run
# it prints the wall time, the peak memory, the time of each step, the ratio of the wall time to
# the FFT work of the same run, the ratio of range compression to its own line transforms; then the
# point targets, and the time of each step of the whole chain with the estimators (the range line transforms and the omega-k blocks, measured by
# bench_chain_fft right after it with the same thread count), then the point targets' worst figures.
#
#   bench/bench_chain.sh [build/bin]        (scratch files under $TMPDIR, about 3 GB, removed at the end)
#
# Before each run a 3 GB scratch file is written and deleted, so that the run's products go into
# memory the machine has used before: on the project's virtual machines the first use of guest
# memory costs about 2.7 s per GB (a new 1.1 GB file takes about 3 s to write, 0.23 s into recycled
# memory), which would otherwise weigh more than the focusing. QORVEX_BENCH_COLD=1 leaves it out.
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
bin=$(cd "${1:-$top/build/bin}" && pwd)
dir=$(mktemp -d "${TMPDIR:-/tmp}/qorvex-bench-chain-XXXXXX")
trap 'rm -rf "$dir"' EXIT
mkdir -p "$dir/work" "$dir/etc"
"$top/tools/qorvex-make-config" --share "$top/share/qorvex" --exe "$bin" --work "$dir/work" --out "$dir/etc" >/dev/null
export QORVEX_INIT_DIR="$dir/etc"
export QORVEX_WORKING_FILE="$dir/work/bench.working"

warm() {
  [ "${QORVEX_BENCH_COLD:-0}" = 1 ] && return 0
  dd if=/dev/zero of="$dir/warm" bs=1M count=3000 status=none && rm -f "$dir/warm"
}

echo "== simulating a full ERS frame"
"$bin/qorvex_simulate" --preset ers2 --full-frame --write-doppler --no-noise --quiet --out "$dir/ers_raw"

# Steps 0, 2 and 5: focusing, no multi-look, no TIFF, no ambiguity; steps 1 and 3 skipped.
printf '%s\n' "bench: full ERS frame" "$dir/ers_raw" OK "$dir/ers_slc" 1 5 NotOK NotOK NotOK 0.333 0 NotOK \
  NotOK NotOK NotOK NotOK OK NotOK OK NotOK 1 > "$dir/args.txt"

# Each configuration runs QORVEX_BENCH_ROUNDS times (2); the fastest run and the fastest FFT work
# count, since the virtual machines' neighbours slow single runs by up to a third.
rounds=${QORVEX_BENCH_ROUNDS:-2}
# Both azimuth modes side by side in the same run: the block mode (one velocity per block) and the
# precise mode (each range column at its own effective velocity).
for mode in block precise; do
export QORVEX_AZIMUTH=$mode
for threads in 1 2; do
  wall=""; fftsec=""
  for round in $(seq "$rounds"); do
    rm -f "$dir"/ers_rc* "$dir"/ers_slc* "$dir"/ers_par* "$dir/work/Process.trace"
    printf '0\nbench\n' > "$QORVEX_WORKING_FILE"
    warm
    QORVEX_THREADS=$threads /usr/bin/time -f '%e %M' -o "$dir/time.txt" "$bin/qorvex" "$dir/args.txt" \
      2> "$dir/stderr.txt" || { cat "$dir/stderr.txt"; exit 1; }
    read -r w r < "$dir/time.txt"
    trace="$dir/work/Process.trace"
    lines=$(sed -n 's/.*<NrOfLinesPerImage>\([0-9]*\)<.*/\1/p' "$dir/ers_raw.sml" | head -1)
    rgfft=$(sed -n 's/.*<NrOfPixelsPerLine>\([0-9]*\)<.*/\1/p' "$dir/ers_raw.sml" | head -1)
    nazft=$(sed -n 's/^Number of lines in every processed block: //p' "$trace" | head -1)
    bytes=$(sed -n 's/^SAR data buffer size (bytes): //p' "$trace" | head -1)
    nrfft=$((bytes / 8 / nazft))
    blocks=$(grep -c '^Processing lines \[' "$trace")
    if [ -z "$wall" ] || awk -v a="$w" -v b="$wall" 'BEGIN { exit !(a < b) }'; then
      wall=$w; rss=$r; cp "$trace" "$dir/best.trace"
    fi
    f=$(QORVEX_THREADS=$threads "$bin/bench_chain_fft" "$lines" "$rgfft" "$blocks" "$nazft" "$nrfft" "$threads")
    fs=$(sed -n 's/.*FFT work \([0-9.]*\) s.*/\1/p' <<< "$f")
    if [ -z "$fftsec" ] || awk -v a="$fs" -v b="$fftsec" 'BEGIN { exit !(a < b) }'; then fftsec=$fs; fft=$f; fi
  done
  echo "== $mode mode, $threads thread(s), best of $rounds: wall $wall s, peak memory $((rss / 1024)) MB, $blocks blocks of $nazft x $nrfft"
  sed -n 's/^DURATION \[\(.*\)\]  (s) = \(.*\)/   step "\1": \2 s/p' "$dir/best.trace"
  echo "   FFT work alone: $fft"
  awk -v w="$wall" -v f="$fftsec" 'BEGIN { printf "   ratio of the wall time to the FFT work: %.2f\n", w / f }'
  rcsec=$(sed -n 's/^DURATION \[ range compression\]  (s) = //p' "$dir/best.trace")
  rgsec=$(sed -n 's/^range transforms \([0-9.]*\) s.*/\1/p' <<< "$fft")
  awk -v r="$rcsec" -v f="$rgsec" 'BEGIN { printf "   range compression against its own transforms: %.2f\n", r / f }'
done

echo "== $mode mode: point targets of the SLC of steps 0, 2 and 5 against the simulator's truth (worst case)"
"$bin/qorvex_irf" --slc "$dir/ers_slc" --truth "$dir/ers_raw_truth.json" --json "$dir/irf_$mode.json" | tail -n 6
done
unset QORVEX_AZIMUTH

# The whole chain on the same frame, two threads: every estimator runs (its estimate on a frame of
# isolated targets is not the point here, its cost is).
rm -f "$dir"/ers_rc* "$dir/work/Process.trace"
printf '%s\n' "bench: full ERS frame, whole chain" "$dir/ers_raw" OK "$dir/ers_slc_all" 1 5 NotOK NotOK NotOK 0.333 0 OK \
  NotOK NotOK NotOK NotOK NotOK NotOK NotOK NotOK 0 > "$dir/args_all.txt"
printf '0\nbench\n' > "$QORVEX_WORKING_FILE"
warm
QORVEX_THREADS=2 /usr/bin/time -f '%e %M' -o "$dir/time.txt" "$bin/qorvex" "$dir/args_all.txt" 2> "$dir/stderr.txt" ||
  { cat "$dir/stderr.txt"; exit 1; }
read -r wall rss < "$dir/time.txt"
echo "== whole chain (steps 0, 1, 2, 4, 3, 3, 3, 5), 2 threads: wall $wall s, peak memory $((rss / 1024)) MB"
sed -n 's/^DURATION \[\(.*\)\]  (s) = \(.*\)/   step "\1": \2 s/p' "$dir/work/Process.trace"

