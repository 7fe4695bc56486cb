#!/usr/bin/env bash
# Throughput of `qdm METHOD --jobs N FILE...`: writes RECORDS CSV records of
# SAMPLES real samples (two damped sinusoids in noise, fixed seed) and times one
# run over all of them for each job count, best of REPEATS runs. The run reads
# the files, fits them with the library's batch call on N threads (all records
# have one length: one call per chunk of files) and prints their JSON lines, so
# the figure is the whole tool's, reading and printing included.
#
#   bench/cli_jobs.sh [QDM] [RECORDS] [SAMPLES] [METHOD] [JOBS...]
#   defaults: build/release/cli/qdm 2000 256 pencil, jobs 1 2
#
# Prints records per second for each job count and the speed-up over one job.
set -euo pipefail
qdm=$(realpath "${1:-build/release/cli/qdm}")
records=${2:-2000} samples=${3:-256} method=${4:-pencil}
shift $(($# < 4 ? $# : 4))
jobs=("${@:-1}")
[ $# -eq 0 ] && jobs=(1 2)
repeats=${REPEATS:-3}
dir=$(mktemp -d)
trap 'rm -rf "$dir"' EXIT
/usr/bin/python3 - "$dir" "$records" "$samples" <<'PY'
import math, random, sys
out, records, samples = sys.argv[1], int(sys.argv[2]), int(sys.argv[3])
rng = random.Random(20240601)
for r in range(records):
    f1, f2 = rng.uniform(0.05, 0.2), rng.uniform(0.25, 0.45)
    with open(f"{out}/r{r:05d}.csv", "w") as f:
        for t in range(samples):
            x = (math.exp(-0.002 * t) * math.cos(2 * math.pi * f1 * t)
                 + 0.5 * math.exp(-0.004 * t) * math.cos(2 * math.pi * f2 * t + 1.0)
                 + 0.1 * rng.gauss(0, 1))
            f.write(f"{x!r}\n")
PY
cd "$dir"
echo "qdm $method: $records records of $samples samples, $(nproc) cores, best of $repeats"
base=""
for j in "${jobs[@]}"; do
  best=""
  for ((i = 0; i < repeats; i++)); do
    start=$(date +%s.%N)
    "$qdm" "$method" --jobs "$j" r*.csv >lines.jsonl 2>/dev/null
    t=$(echo "$(date +%s.%N) - $start" | bc -l)
    [ -z "$best" ] || [ "$(echo "$t < $best" | bc -l)" = 1 ] && best=$t
  done
  [ "$(wc -l <lines.jsonl)" = "$records" ] || { echo "expected $records lines"; exit 1; }
  [ -n "$base" ] || base=$best
  printf 'jobs %-3s %8.3f s  %9.1f records/s  speed-up %.2f\n' "$j" "$best" \
    "$(echo "$records / $best" | bc -l)" "$(echo "$base / $best" | bc -l)"
done
