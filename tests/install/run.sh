#!/usr/bin/env bash
# Installs the built tree into a temporary prefix and uses it as a user would:
# a CMake project with find_package(qdm) and a plain cc line with pkg-config
# build the README's C example, which must reproduce the host face's
# covariance coefficients (qdm_example) on the complex test record. Then, run
# as root with QDM_TEST_DEB=1, the Debian package installs with apt-get and
# its library loads. Arguments: source dir, build dir.
set -euo pipefail
src=$1 build=$2
tmp=$(mktemp -d)
trap 'rm -rf "$tmp"' EXIT
record=$src/tests/data/marple64.csv

# The README's C block is examples/plain_covariance.c, word for word.
awk '/^```c$/{on=1; next} /^```$/{on=0} on' "$src/README.md" > "$tmp/readme.c"
diff -u "$src/examples/plain_covariance.c" "$tmp/readme.c"

cmake --install "$build" --prefix "$tmp/prefix" > /dev/null
nm -D --defined-only "$tmp/prefix"/lib*/libqdm.so | awk '{print $3}' | sort > "$tmp/exports"
[ "$(wc -l < "$tmp/exports")" -eq 15 ] || { cat "$tmp/exports"; exit 1; }

cmake -S "$src/tests/install/consumer" -B "$tmp/consumer" -DCMAKE_PREFIX_PATH="$tmp/prefix" \
  -DEXAMPLE_SOURCE="$src/examples/plain_covariance.c" > /dev/null
cmake --build "$tmp/consumer" > /dev/null
export PKG_CONFIG_PATH=$(dirname "$(find "$tmp/prefix" -name qdm.pc)")
libdir=$(pkg-config --variable=libdir qdm)
# The README's cc line as it stands: the .pc file's run path lets it run.
cc -std=c99 -Wall -Werror "$src/examples/plain_covariance.c" $(pkg-config --cflags --libs qdm) \
  -o "$tmp/pkgconfig_covariance"
readelf -d "$tmp/pkgconfig_covariance" | grep "R.*PATH.*$libdir" >/dev/null

# The example reads records of any length: the test record and one of 10,000
# samples (a fixed pseudo-random walk, past any buffer a C example might keep).
long=$tmp/long.csv
awk 'BEGIN { s = 1; for (i = 0; i < 10000; ++i) { s = (s * 69069 + 1) % 4294967296;
  printf "%.6f,%.6f\n", s / 4294967296 - 0.5, (s % 1000) / 1000 - 0.5 } }' > "$long"
for input in "$record" "$long"; do
"$build/examples/qdm_example" covariance "$input" --order 15 --json > "$tmp/host.json"
for program in "$tmp/consumer/plain_covariance" "$tmp/pkgconfig_covariance"; do
  "$program" "$input" 15 > "$tmp/plain.txt"
  /usr/bin/python3 - "$tmp/host.json" "$tmp/plain.txt" <<'PY'
import json, sys
host = json.load(open(sys.argv[1]))["results"]
lines = [l.split() for l in open(sys.argv[2])]
assert float(lines[0][1]) == host["noise_variance"], (lines[0], host["noise_variance"])
coeffs = [(float(l[1]), float(l[2])) for l in lines[1:]]
flat = host["coefficients"]  # interleaved real and imaginary parts
assert coeffs == list(zip(flat[0::2], flat[1::2])), "coefficients differ"
PY
done
done
echo "installed tree: find_package and pkg-config consumers match the host face"

if [ "${QDM_TEST_DEB:-0}" = 1 ] && [ "$(id -u)" = 0 ]; then
  (cd "$build" && cpack -G DEB > /dev/null)
  deb=$(ls "$build"/qdm_*.deb)
  dpkg-deb -f "$deb" Depends
  DEBIAN_FRONTEND=noninteractive apt-get install -y -qq "$deb" > /dev/null
  cc -std=c99 "$src/examples/plain_covariance.c" $(PKG_CONFIG_PATH= pkg-config --cflags --libs qdm) \
    -o "$tmp/system_covariance"
  "$tmp/system_covariance" "$record" 15 | head -1
  DEBIAN_FRONTEND=noninteractive apt-get remove -y -qq qdm > /dev/null
  echo "Debian package: installed, loaded, removed"
fi
