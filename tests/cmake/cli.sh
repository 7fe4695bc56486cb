#!/usr/bin/env bash
# End-to-end checks of the installed qdm tool: cli.sh PREFIX WORKDIR DATA CASE.
# PREFIX is a tree made by `cmake --install`; every case runs the installed copy
# (no build-tree paths, no LD_LIBRARY_PATH). Prints what it checks; exit 0 = pass.
set -uo pipefail
prefix=$1 work=$2 data=$3 case=$4
qdm=$prefix/bin/qdm
py=/usr/bin/python3
unset LD_LIBRARY_PATH
mkdir -p "$work" && cd "$work" || exit 1
fail() { echo "FAIL: $*"; exit 1; }
# expect CODE ARGS...: runs qdm, checks the exit code; stdout in out, stderr in err.
expect() {
  local want=$1; shift
  "$qdm" "$@" >out 2>err; local rc=$?
  [ "$rc" = "$want" ] || fail "qdm $* exited $rc, expected $want; stderr: $(cat err)"
  if [ "$want" != 0 ]; then
    [ "$(wc -l <err)" = 1 ] || fail "qdm $*: expected one line on stderr, got: $(cat err)"
    grep -q '^qdm: ' err || fail "qdm $*: stderr line lacks the program name: $(cat err)"
  fi
  echo "ok: qdm $* -> $rc $(head -c 120 err)"
}

case $case in
stdin_stdout)
  # Standard input, '-' or no file, to standard output; the record is complete JSON.
  "$qdm" covariance - --order 15 --json <"$data" >dash.json 2>err || fail "stdin: $(cat err)"
  "$qdm" covariance --order 15 --json <"$data" >nofile.json 2>>err || fail "no file: $(cat err)"
  [ ! -s err ] || fail "unexpected stderr: $(cat err)"
  cmp -s dash.json nofile.json || fail "'-' and no file differ"
  $py - dash.json <<'PY' || fail "JSON record"
import json, sys
r = json.load(open(sys.argv[1]))
assert r["status"] == 0 and r["signal"] == {"type": "complex", "samples": 64}, r
assert len(r["results"]["coefficients"]) == 16 and "noise_variance" in r["results"], r
PY
  expect 0 covariance --order 15 --csv - <"$data"
  [ "$(head -1 out)" = "real,imag" ] && [ "$(wc -l <out)" = 17 ] || fail "CSV: $(head -3 out)"
  # The installed tree moves as a whole: the tool finds its library beside it.
  rm -rf moved && cp -a "$prefix" moved && qdm=$PWD/moved/bin/qdm
  expect 0 covariance - --order 15 --json <"$data"
  cmp -s out dash.json || fail "the moved tree gives other output"
  readelf -d "$qdm" | grep -q 'RUNPATH.*\$ORIGIN/\.\./' || fail "run path not relative to the program"
  [ -f "$prefix/share/man/man1/qdm.1" ] || fail "man page not installed"
  ;;
jobs)
  # One bad file among good ones: its own error line, the others fitted, input order kept.
  cp "$data" a.csv && head -40 "$data" >b.csv && printf '1\n2\nxyz\n' >bad.csv
  expect 2 pencil --jobs 2 a.csv bad.csv b.csv
  $py - out <<'PY' || fail "JSON lines: $(cat out)"
import json, sys
lines = [json.loads(l) for l in open(sys.argv[1])]
assert [l["input"] for l in lines] == ["a.csv", "bad.csv", "b.csv"], lines
assert lines[0]["status"] == 0 and lines[2]["status"] == 0, lines
assert lines[0]["signal"]["samples"] == 64 and lines[2]["signal"]["samples"] == 40, lines
assert lines[1]["exit"] == 1 and "xyz" in lines[1]["error"] and "results" not in lines[1], lines[1]
PY
  grep -q 'bad.csv:3' err || fail "stderr does not name the bad record: $(cat err)"
  expect 0 pencil --jobs 2 a.csv b.csv a.csv
  [ "$(wc -l <out)" = 3 ] || fail "three lines expected"
  ;;
exit_codes)
  expect 0 --version
  grep -q '^qdm [0-9]' out || fail "--version: $(cat out)"
  expect 0 pencil --help
  expect 1
  expect 1 fourier
  expect 1 covariance --order twelve "$data"
  expect 1 covariance no_such_file.csv
  printf '1,2\n3\n' >ragged.csv
  expect 1 covariance ragged.csv
  expect 2 covariance --order 0 "$data"
  grep -q -- '-42412' err || fail "status number missing: $(cat err)"
  expect 0 pencil --points 8 --upper 3 "$data"  # options of other methods are ignored
  "$qdm" covariance "$data" >/dev/full 2>err; rc=$?
  [ $rc = 3 ] && [ "$(wc -l <err)" = 1 ] || fail "/dev/full: exit $rc, $(cat err)"
  echo "ok: qdm covariance >/dev/full -> 3 $(cat err)"
  ;;
plot)
  # Without gnuplot the fit succeeds and one line says so; with it, a PNG is drawn.
  rm -f none.png
  PATH=/nonexistent "$qdm" pencil --example --real-signal --plot none.png >out 2>err \
    || fail "no gnuplot: exit $?"
  [ "$(wc -l <err)" = 1 ] && grep -q 'gnuplot not found' err || fail "warning: $(cat err)"
  grep -q '^modes' out && [ ! -e none.png ] || fail "fit output without gnuplot"
  echo "ok: without gnuplot: $(cat err)"
  if command -v gnuplot >/dev/null; then
    expect 0 pcarspectrum --example --real-signal --plot spectrum.png
    [ "$(head -c 4 spectrum.png | tail -c 3)" = PNG ] || fail "no PNG drawn"
    expect 3 covariance --example --plot "$work/no_such_dir/x.png"
  fi
  ;;
*) fail "unknown case $case" ;;
esac
echo "passed: $case"
