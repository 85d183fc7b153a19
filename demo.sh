#!/usr/bin/env bash
# The main job on an embedded default: simulates an ERS-2 raw scene (point targets in clutter, noise)
# whose header carries no Doppler centroid and a processing velocity 1 % off, focuses it with
# qorvex-focus through the whole chain to the SLC, the power image and its TIFF, prints the
# estimates beside the truth, makes the SLC's TIFF with the positional interface that calling
# programs use, and measures the targets. Installs what is missing and builds first.
# Everything goes to demo-output/.
set -euo pipefail
top=$(cd "$(dirname "$0")" && pwd)
"$top/tools/setup.sh"

bin="$top/build/bin"
out="$top/demo-output"
rm -rf "$out"
mkdir -p "$out/archive" "$out/work"

echo "== simulating an ERS-2 scene: 16 point targets in clutter; the header carries no Doppler"
echo "   centroid and a processing velocity 1 % above the truth"
"$bin/qorvex_simulate" --preset ers2 --scatterers 6000 --scatterer-rms 0.3 --scatterer-margin 1300 \
  --velocity-error 0.01 --out "$out/archive/ers_demo_raw" --quiet

# The whole chain from the raw data and its header: parameters, Doppler centroid, range
# compression, Doppler ambiguity, three autofocus runs, omega-k focusing, multi-look and the power
# image's TIFF. The azimuth degree of the Doppler table is 0: one centroid per range position for
# a scene shorter than one azimuth block.
echo "== running: $bin/qorvex-focus --out $out --doppler-degree 0 --keep --json $out/summary.json $out/archive/ers_demo_raw"
set +e
"$bin/qorvex-focus" --out "$out" --doppler-degree 0 --keep --json "$out/summary.json" "$out/archive/ers_demo_raw"
status=$?
set -e

# The estimates beside the simulator's truth.
truth="$out/archive/ers_demo_raw_truth.json"
value() { sed -n "s/.*\"$1\": *\([-0-9.e]*\).*/\1/p" "$2" | head -n 1; }
if [ "$status" -eq 0 ]; then
  echo "== estimates against the truth"
  printf '   %-42s %14s %14s\n' "" "estimated" "truth"
  est_step1=$(sed -n '/DOPPLER VALUE(0   0)/{n;s/.*>\([^<]*\)<.*/\1/p}' "$out/ers_demo_raw.sml" | head -n 1)
  printf '   %-42s %14.2f\n' "Doppler centroid from the echoes (Hz)" "$est_step1"
  printf '   %-42s %14d\n' "PRF cycles added by the ambiguity step" "$(value ambiguity "$out/summary.json")"
  printf '   %-42s %14.2f %14.2f\n' "Doppler centroid after it (Hz)" "$(value doppler_hz "$out/summary.json")" "$(value centroid "$truth")"
  printf '   %-42s %14.3f %14.3f\n' "velocity after three autofocus runs (m/s)" "$(value velocity_m_s "$out/summary.json")" \
    "$(value true_processing_velocity "$truth")"
  printf '   %-42s %14.3f\n' "velocity in the raw header (m/s)" "$(value header_velocity "$truth")"

  # The SLC's TIFF: the conversion alone, with the positional arguments file of calling programs
  # (a free first line, then one argument per line; docs/frontend.md).
  mkdir -p "$out/etc"
  "$top/tools/qorvex-make-config" --share "$top/share/qorvex" --exe "$bin" --work "$out/work" --out "$out/etc" >/dev/null
  printf '%s\n' "Qorvex demo: the SLC's TIFF" "$out/ers_demo_slc" NotOK "$out/ers_demo_pwr" 1 5 NotOK OK NotOK 0.333 \
    0 NotOK NotOK NotOK NotOK OK OK OK OK NotOK 0 > "$out/slc_tiff_args.txt"
  echo "== running: $bin/qorvex $out/slc_tiff_args.txt"
  set +e
  QORVEX_INIT_DIR="$out/etc" QORVEX_WORKING_FILE="$out/work/demo.working" "$bin/qorvex" "$out/slc_tiff_args.txt" \
    2> "$out/work/stderr.txt"
  status=$?
  set -e
  echo "   exit status $status ($(sed -n 's/^QORVEX EXIT ID: /failure id /p' "$out/work/stderr.txt" | tail -n 1))"
fi

if [ -e "$out/ers_demo_slc.sml" ]; then
  echo "== point targets of the SLC against the simulator's truth"
  "$bin/qorvex_irf" --slc "$out/ers_demo_slc" --truth "$truth" --json "$out/ers_demo_irf.json"
fi
exit "$status"
