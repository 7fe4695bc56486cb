#!/usr/bin/env bash
# A long fuzzing campaign over the analysis exports.
#
#   tools/fuzz_campaign.sh [jobs] [seconds]      (defaults: 1 job, 3600 s)
#
# Builds the libFuzzer target (build/campaign: clang-14, ASan + UBSan) and fuzzes
# from the seed corpus with `jobs` processes for `seconds`. New inputs collect
# in build/campaign/out/corpus, which the next campaign continues from. Every
# crash, leak, time-out or sanitizer report leaves its input in
# build/campaign/out/ (crash-*, leak-*, timeout-*, oom-*) and the campaign goes
# on: fix each fault and copy its input into tests/fuzz/regressions/, where
# the fuzz.replay test runs it on every CI run. The last line printed is the
# campaign's figure; the exit status is non-zero if anything was found.
set -uo pipefail
cd "$(dirname "$0")/.."
jobs=${1:-1}
seconds=${2:-3600}
root=$PWD
out=$root/build/campaign/out
cmake -S . -B build/campaign -DCMAKE_C_COMPILER=clang-14 -DCMAKE_CXX_COMPILER=clang++-14 \
  -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_FUZZ=ON -DQDM_BUILD_EXAMPLE=OFF >/dev/null || exit 1
cmake --build build/campaign -j"$(nproc)" --target fuzz_exports >/dev/null || exit 1
mkdir -p "$out/corpus"
cd "$out" || exit 1
options=(-max_total_time="$seconds" -timeout=30 -rss_limit_mb=3072 -print_final_stats=1
         -artifact_prefix="$out/")
start=$(date +%s)
# On the reference BLAS and LAPACK, as the sanitizer suite: OpenBLAS's complex
# gemv reads past its own buffers, which ASan's allocator layout can turn into
# a fault inside OpenBLAS.
export LD_LIBRARY_PATH=/usr/lib/x86_64-linux-gnu/blas:/usr/lib/x86_64-linux-gnu/lapack
# Fork mode (one supervisor, `jobs` workers) records every crash and goes on,
# so one campaign finds more than its first fault.
"$root/build/campaign/tests/fuzz_exports" -fork="$jobs" -ignore_crashes=1 -ignore_timeouts=1 \
  -ignore_ooms=1 "${options[@]}" "$out/corpus" "$root/tests/fuzz/corpus" >"$out/campaign.log" 2>&1
rc=$?
execs=$(grep -oE '^#[0-9]+' "$out/campaign.log" | tail -n 1 | tr -d '#')
crashes=$(find "$out" -maxdepth 1 -name 'crash-*' -o -maxdepth 1 -name 'leak-*' \
          -o -maxdepth 1 -name 'timeout-*' -o -maxdepth 1 -name 'oom-*' | wc -l)
[ "$crashes" -ne 0 ] && rc=1
echo "fuzz campaign: ${execs:-0} executions in $(( $(date +%s) - start )) s with $jobs job(s)," \
     "exit $rc, $crashes crash/leak/timeout inputs in $out"
exit $rc
