#!/usr/bin/env bash
# The main job: builds libqdm and the example host program (build/release) and
# runs it, as a host would, on the built-in example signal (three damped
# sinusoids at 120, 210 and 340 Hz in noise, 1000 Hz sampling). Leaves behind:
#   build/example/fit.txt       the fitted modes (matrix pencil), as a table
#   build/example/fit.json      the same as JSON
#   build/example/spectrum.csv  the principal-component AR spectrum (Hz, dB)
#   build/example/spectrum.png  its plot, the fitted modes marked
# Installs what is missing on a fresh Debian 12 machine (run as root).
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \
  libopenblas0-serial libgtest-dev libgmock-dev gnuplot-nox

cmake -S . -B build/release -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build build/release --target qdm_example -j"$(nproc)" >/dev/null
example=build/release/examples/qdm_example
out=build/example
mkdir -p "$out"

echo "== fit: matrix pencil modes of the built-in example"
"$example" pencil --real-signal | tee "$out/fit.txt"
"$example" pencil --real-signal --json > "$out/fit.json"
echo
echo "== spectrum: principal-component AR spectrum of the built-in example"
"$example" pcarspectrum --real-signal --csv "$out/spectrum.csv" --png "$out/spectrum.png"
echo
echo "left in $out: fit.txt fit.json spectrum.csv spectrum.png"
