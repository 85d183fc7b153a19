#!/usr/bin/env bash
# The main job on an embedded default: simulates an ERS-2 raw scene (point targets in clutter, noise)
# whose header carries no Doppler centroid and a processing velocity 1 % off, focuses it through the
# whole chain to the SLC, the power image and their TIFFs, prints the estimates beside the truth and
# measures the targets. Installs what is missing and builds first.
# Everything goes to demo-output/.
set -euo pipefail
top=$(cd "$(dirname "$0")" && pwd)
"$top/tools/setup.sh"

bin="$top/build/bin"
out="$top/demo-output"
rm -rf "$out"
mkdir -p "$out/work" "$out/etc"
"$top/tools/qorvex-make-config" --share "$top/share/qorvex" --exe "$bin" --work "$out/work" --out "$out/etc" >/dev/null
export QORVEX_INIT_DIR="$out/etc"
export QORVEX_WORKING_FILE="$out/work/demo.working"

echo "== simulating an ERS-2 scene: 16 point targets in clutter; the header carries no Doppler"
echo "   centroid and a processing velocity 1 % above the truth"
"$bin/qorvex_simulate" --preset ers2 --scatterers 6000 --scatterer-rms 0.3 --scatterer-margin 1300 \
  --velocity-error 0.01 --out "$out/ers_demo_raw" --quiet

# An arguments file: a free first line, then the 19 arguments and the Doppler polynomial degree.
# $1 input, $2 focus, $3 output root, $4 multi-look, $5 TIFF, $6 ambiguity, $7..$10 skip steps 0..3.
# The azimuth degree of the Doppler table is 0: one centroid per range position for the scene.
write_args() {
  printf '%s\n' "Qorvex demo: simulated ERS-2 scene" "$1" "$2" "$3" 1 5 "$4" "$5" NotOK 0.333 0 "$6" \
    NotOK NotOK NotOK "$7" "$8" "$9" "${10}" NotOK 0
}

# run NAME ARGS...: one driver run; sets status and id, says where a failed run stopped.
run() {
  local name=$1; shift
  write_args "$@" > "$out/$name.txt"
  printf '0\nQorvex demo\n' > "$QORVEX_WORKING_FILE"
  echo "== running: $bin/qorvex $out/$name.txt"
  set +e
  "$bin/qorvex" "$out/$name.txt" 2> "$out/work/stderr.txt"
  status=$?
  set -e
  id=$(sed -n 's/^QORVEX EXIT ID: //p' "$out/work/stderr.txt" | tail -n 1)
  echo "   exit status $status (failure id ${id:-none})"
  if [ "$status" -ne 0 ] && [ -f "$QORVEX_WORKING_FILE" ]; then
    echo "   the run stopped in step: $(sed -n 2p "$QORVEX_WORKING_FILE")"
    sed -n '3,7p' "$QORVEX_WORKING_FILE" | sed '/^ *$/d; s/^/   /'
  fi
}

# The whole chain from the raw data and its header: parameters, Doppler centroid, range
# compression, Doppler ambiguity, three autofocus runs, omega-k focusing, multi-look and the power
# image's TIFF.
run ers_demo_args "$out/ers_demo_raw" OK "$out/ers_demo_slc" OK OK OK NotOK NotOK NotOK NotOK

# The estimates beside the simulator's truth.
truth="$out/ers_demo_raw_truth.json"
value() { sed -n "s/.*\"$1\": *\([-0-9.e]*\).*/\1/p" "$truth" | head -n 1; }
if [ "$status" -eq 0 ]; then
  est_step1=$(sed -n '/DOPPLER VALUE(0   0)/{n;s/.*>\([^<]*\)<.*/\1/p}' "$out/ers_demo_raw.sml" | head -n 1)
  est_doppler=$(sed -n '/DOPPLER VALUE AFTER AMBIGUITY CORRECTION/{n;s/.*>\([^<]*\)<.*/\1/p}' "$out/ers_demo_rc.sml" | head -n 1)
  est_amb=$(sed -n 's/.*, rounded: \([-0-9]*\).*/\1/p' "$out/work/Process.trace" | tail -n 1)
  est_vel=$(sed -n 's/.*<Velocity>\([^<]*\)<.*/\1/p' "$out/ers_demo_par.sml" | head -n 1)
  echo "== estimates against the truth"
  printf '   %-42s %14s %14s\n' "" "estimated" "truth"
  printf '   %-42s %14.2f\n' "Doppler centroid from the echoes (Hz)" "$est_step1"
  printf '   %-42s %14d\n' "PRF cycles added by the ambiguity step" "$est_amb"
  printf '   %-42s %14.2f %14.2f\n' "Doppler centroid after it (Hz)" "$est_doppler" "$(value centroid)"
  printf '   %-42s %14.3f %14.3f\n' "velocity after three autofocus runs (m/s)" "$est_vel" "$(value true_processing_velocity)"
  printf '   %-42s %14.3f\n' "velocity in the raw header (m/s)" "$(value header_velocity)"
fi

# The SLC's TIFF: the conversion alone, on the SLC just made.
if [ "$status" -eq 0 ]; then
  run ers_demo_slc_tiff_args "$out/ers_demo_slc" NotOK "$out/ers_demo_pwr" NotOK OK NotOK OK OK OK OK
fi

echo "== products in $out"
for f in ers_demo_raw ers_demo_raw.sml ers_demo_raw_truth.json ers_demo_par.sml ers_demo_rc ers_demo_rc.sml \
         ers_demo_slc ers_demo_slc.sml ers_demo_slc.hdr ers_demo_slc.tif ers_demo_pwr ers_demo_pwr.sml \
         ers_demo_pwr.hdr ers_demo_pwr.tif; do
  if [ -e "$out/$f" ]; then
    printf '   %-26s %12s bytes\n' "$f" "$(stat -c %s "$out/$f")"
  else
    printf '   %-26s %s\n' "$f" "(not made)"
  fi
done
echo "   log and trace: $out/work/Process.log, $out/work/Process.trace"

if [ -e "$out/ers_demo_slc.sml" ]; then
  echo "== point targets of the SLC against the simulator's truth"
  "$bin/qorvex_irf" --slc "$out/ers_demo_slc" --truth "$out/ers_demo_raw_truth.json" --json "$out/ers_demo_irf.json"
fi
exit "$status"
