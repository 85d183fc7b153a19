#!/usr/bin/env bash
# The main job on an embedded default, as a user with a real archive runs it: simulates an ERS-2
# acquisition (point targets in clutter, noise) written as an ERS CEOS raw product (leader and data
# file, which state no Doppler centroid), focuses it with qorvex-focus, which imports it and runs
# the whole chain to the SLC, the power image and its TIFF, prints the estimates beside the truth,
# makes the SLC's TIFF with the positional interface that calling programs use, and measures the
# targets. Installs what is missing and builds first. Everything goes to demo-output/.
set -euo pipefail
top=$(cd "$(dirname "$0")" && pwd)
"$top/tools/setup.sh"

bin="$top/build/bin"
out="$top/demo-output"
rm -rf "$out"
mkdir -p "$out/archive" "$out/work"

echo "== simulating an ERS-2 acquisition: 16 point targets in clutter, written as an ERS CEOS raw product"
echo "   (a leader and a data file, with two lost lines, a repeated line and a window shift)"
"$bin/qorvex_simulate" --preset ers2 --format ceos --scatterers 6000 --scatterer-rms 0.3 --scatterer-margin 1300 \
  --drop-lines 1000,1001 --repeat-line 2000 --swst-change 3300:22 --out "$out/archive/ers_demo" --quiet
"$bin/qorvex-import" --out "$out/import-check" --json "$out/import.json" "$out/archive/ers_demo" | sed 's/^/   /'
rm -rf "$out/import-check"

# The whole chain from the archive: import, parameters, Doppler centroid, range compression,
# Doppler ambiguity, three autofocus runs, omega-k focusing, multi-look and the power image's TIFF.
# The azimuth degree of the Doppler table is 0: one centroid per range position for a scene
# shorter than one azimuth block.
echo "== running: $bin/qorvex-focus --out $out --doppler-degree 0 --keep --json $out/summary.json $out/archive/ers_demo"
set +e
"$bin/qorvex-focus" --out "$out" --doppler-degree 0 --keep --json "$out/summary.json" "$out/archive/ers_demo"
status=$?
set -e
# The product's name comes from the archive: sensor, date and time of the first line, orbit.
name=$(sed -n 's/.*"name": *"\([^"]*\)".*/\1/p' "$out/summary.json" | head -n 1)

# The estimates beside the simulator's truth.
truth="$out/archive/ers_demo_truth.json"
value() { sed -n "s/.*\"$1\": *\([-0-9.e]*\).*/\1/p" "$2" | head -n 1; }
if [ "$status" -eq 0 ]; then
  echo "== estimates against the truth"
  printf '   %-42s %14s %14s\n' "" "estimated" "truth"
  est_step1=$(sed -n '/DOPPLER VALUE(0   0)/{n;s/.*>\([^<]*\)<.*/\1/p}' "$out/$name.qorvex/${name}_raw.sml" | head -n 1)
  printf '   %-42s %14.2f\n' "Doppler centroid from the echoes (Hz)" "$est_step1"
  printf '   %-42s %14d\n' "PRF cycles added by the ambiguity step" "$(value ambiguity "$out/summary.json")"
  printf '   %-42s %14.2f %14.2f\n' "Doppler centroid after it (Hz)" "$(value doppler_hz "$out/summary.json")" "$(value centroid "$truth")"
  printf '   %-42s %14.3f %14.3f\n' "velocity after three autofocus runs (m/s)" "$(value velocity_m_s "$out/summary.json")" \
    "$(value true_processing_velocity "$truth")"
  printf '   %-42s %14.3f\n' "velocity from the leader's orbit (m/s)" \
    "$(sed -n '/<ProcessingVelocity>/,/<\/ProcessingVelocity>/s/.*<ValueDouble ID = "0">\([^<]*\)<.*/\1/p' "$out/$name.qorvex/${name}_raw.sml" | head -n 1)"

  # The SLC's TIFF: the conversion alone, with the positional arguments file of calling programs
  # (a free first line, then one argument per line; docs/frontend.md).
  mkdir -p "$out/etc"
  "$top/tools/qorvex-make-config" --share "$top/share/qorvex" --exe "$bin" --work "$out/work" --out "$out/etc" >/dev/null
  printf '%s\n' "Qorvex demo: the SLC's TIFF" "$out/${name}_slc" NotOK "$out/${name}_pwr" 1 5 NotOK OK NotOK 0.333 \
    0 NotOK NotOK NotOK NotOK OK OK OK OK NotOK 0 > "$out/slc_tiff_args.txt"
  echo "== running: $bin/qorvex $out/slc_tiff_args.txt"
  set +e
  QORVEX_INIT_DIR="$out/etc" QORVEX_WORKING_FILE="$out/work/demo.working" "$bin/qorvex" "$out/slc_tiff_args.txt" \
    2> "$out/work/stderr.txt"
  status=$?
  set -e
  echo "   exit status $status ($(sed -n 's/^QORVEX EXIT ID: /failure id /p' "$out/work/stderr.txt" | tail -n 1))"
fi

if [ -n "$name" ] && [ -e "$out/${name}_slc.sml" ]; then
  echo "== point targets of the SLC against the simulator's truth"
  "$bin/qorvex_irf" --slc "$out/${name}_slc" --truth "$truth" --json "$out/${name}_irf.json"
fi
exit "$status"
