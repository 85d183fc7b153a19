#!/usr/bin/env bash
# Installs what is missing, builds, and runs the whole test suite three ways:
#   1. the release build (build/), the suite as developers run it;
#   2. the same suite built with AddressSanitizer and UndefinedBehaviorSanitizer (build-asan/),
#      every target of the project, so that each new step is born under the sanitizers;
#   3. each fuzz harness of tests/fuzz for a short fixed time (build-fuzz/, clang and libFuzzer).
# Arguments go to ctest. QORVEX_TEST_QUICK=1 runs the first alone; QORVEX_FUZZ_SECONDS sets the
# time of each harness (20 s).
set -euo pipefail
top=$(cd "$(dirname "$0")" && pwd)
jobs=$(nproc)
"$top/tools/setup.sh"
echo "== test suite (release)"
ctest --test-dir "$top/build" --output-on-failure -j "$jobs" "$@"
[ "${QORVEX_TEST_QUICK:-0}" = 1 ] && exit 0

echo "== test suite (AddressSanitizer and UndefinedBehaviorSanitizer)"
asan="$top/build-asan"
if [ ! -f "$asan/CMakeCache.txt" ]; then
  generator=()
  command -v ninja >/dev/null && generator=(-G Ninja)
  launcher=()
  command -v ccache >/dev/null && launcher=(-DCMAKE_CXX_COMPILER_LAUNCHER=ccache -DCMAKE_C_COMPILER_LAUNCHER=ccache)
  flags="-fsanitize=address,undefined -fno-sanitize-recover=undefined -fno-omit-frame-pointer"
  cmake -S "$top" -B "$asan" "${generator[@]}" "${launcher[@]}" -DCMAKE_BUILD_TYPE=RelWithDebInfo \
    -DCMAKE_CXX_FLAGS_RELWITHDEBINFO="-O1 -g" -DCMAKE_C_FLAGS_RELWITHDEBINFO="-O1 -g" \
    -DCMAKE_CXX_FLAGS="$flags" -DCMAKE_C_FLAGS="$flags" -DCMAKE_EXE_LINKER_FLAGS="-fsanitize=address,undefined" \
    -DQORVEX_BUILD_BENCH=OFF >/dev/null
fi
cmake --build "$asan" -j "$jobs"
ASAN_OPTIONS=detect_leaks=1:strict_string_checks=1:detect_stack_use_after_return=1 \
UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
  ctest --test-dir "$asan" --output-on-failure -j "$jobs" "$@"

echo "== fuzz harnesses"
QORVEX_FUZZ_NICE=0 "$top/tests/fuzz/run_fuzzers.sh" "${QORVEX_FUZZ_SECONDS:-20}"
