#!/usr/bin/env bash
# End-to-end checks of the installed qdm tool: cli.sh PREFIX WORKDIR DATA README CASE.
# PREFIX is a tree made by `cmake --install`; every case runs the installed copy
# (no build-tree paths, no LD_LIBRARY_PATH). Prints what it checks; exit 0 = pass.
set -uo pipefail
prefix=$1 work=$2 data=$3 readme=$4 case=$5
qdm=$prefix/bin/qdm
py=/usr/bin/python3
unset LD_LIBRARY_PATH
mkdir -p "$work" && cd "$work" || exit 1
fail() { echo "FAIL: $*"; exit 1; }
# expect CODE ARGS...: runs qdm, checks the exit code; stdout in out, stderr in err.
# A failure is one line on stderr that names the program.
expect() {
  local want=$1; shift
  "$qdm" "$@" >out 2>err; local rc=$?
  [ "$rc" = "$want" ] || fail "qdm $* exited $rc, expected $want; stderr: $(head -c 300 err)"
  if [ "$want" != 0 ]; then
    [ "$(wc -l <err)" = 1 ] || fail "qdm $*: expected one line on stderr, got: $(head -c 300 err)"
    grep -q '^qdm: ' err || fail "qdm $*: stderr line lacks the program name: $(head -c 300 err)"
  fi
  echo "ok: qdm $(printf '%q ' "$@" | head -c 100) -> $rc $(head -c 120 err)"
}
# samples TYPE N: the JSON record in out read TYPE (real or complex) with N samples.
samples() {
  $py - "$1" "$2" <<'PY' || fail "expected $1 signal of $2 samples: $(head -c 300 out)"
import json, sys
s = json.load(open("out"))["signal"]
assert s == {"type": sys.argv[1], "samples": int(sys.argv[2])}, s
PY
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
assert len(r["results"]["coefficients"]["re"]) == 16 and "noise_variance" in r["results"], r
PY
  expect 0 covariance --order 15 --csv - <"$data"
  [ "$(head -1 out)" = "re,im" ] && [ "$(wc -l <out)" = 17 ] || fail "CSV: $(head -3 out)"
  # The spectrum is written as a stream: its JSON and CSV forms hold the same doubles.
  "$qdm" pcarspectrum "$data" --nfft 100 --json >spectrum.json || fail "spectrum JSON"
  "$qdm" pcarspectrum "$data" --nfft 100 --csv >spectrum.csv || fail "spectrum CSV"
  $py - <<'PY' || fail "spectrum JSON and CSV differ"
import csv, json
s = json.load(open("spectrum.json"))["results"]["spectrum"]
rows = list(csv.DictReader(open("spectrum.csv")))
assert s["length"] == 128 == len(s["power_db"]) == len(rows), (s["length"], len(rows))
assert all(isinstance(v, float) for v in s["power_db"]) and max(s["power_db"]) == 0.0
assert [float(r["power_db"]) for r in rows] == s["power_db"]
assert [float(r["frequency_hz"]) for r in rows] == s["frequency_hz"]
assert s["frequency_hz"][0] == -0.5 and s["frequency_hz"][5] == -0.5 + 5 / 128  # complex: two-sided
PY
  # The installed tree moves as a whole: the tool finds its library beside it.
  rm -rf moved && cp -a "$prefix" moved && qdm=$PWD/moved/bin/qdm
  expect 0 covariance - --order 15 --json <"$data"
  cmp -s out dash.json || fail "the moved tree gives other output"
  readelf -d "$qdm" | grep 'RUNPATH.*\$ORIGIN/\.\./' >/dev/null || fail "run path not relative to the program"
  [ -f "$prefix/share/man/man1/qdm.1" ] || fail "man page not installed"
  ;;
jobs)
  # One bad file among good ones: its own error line, the others fitted, input order kept.
  cp "$data" a.csv && head -40 "$data" >b.csv && printf '1\n2\nxyz\n' >bad.csv
  cp "$data" $'latin\xff.csv' && printf '1\n2\n\xe9t\xe9\n' >l1.csv
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
  # Per record, a refused value is exit 1 and a failed fit exit 2, as for one file;
  # non-UTF-8 names and contents still give valid JSON lines.
  for i in $(seq 64); do echo 0; done >zeros.csv
  "$qdm" mdl --jobs 2 a.csv zeros.csv $'latin\xff.csv' l1.csv >out 2>err; rc=$?
  [ $rc = 2 ] && [ "$(wc -l <err)" = 2 ] || fail "mixed records: exit $rc, $(cat err)"
  "$qdm" covariance --order 0 --jobs 1 a.csv >>out 2>/dev/null
  $py - out <<'PY' || fail "per-record exit codes: $(cat out)"
import json, sys
lines = [json.loads(l) for l in open(sys.argv[1], encoding="utf-8")]
assert [l.get("exit", 0) for l in lines] == [0, 2, 0, 1, 1], lines
assert lines[2]["input"] == "latin\ufffd.csv" and lines[4]["status"] == -42412, lines
assert lines[1]["status"] < 0 and not -42499 <= lines[1]["status"] <= -42401, lines[1]
assert "\\xe9t\\xe9" in lines[3]["error"], lines[3]
PY
  echo "ok: per-record exit codes 0 2 0 1 1"
  # Standard input is read once, by one thread.
  expect 1 covariance - - --jobs 2 <"$data"
  grep -q "standard input" err || fail "no reason given: $(cat err)"
  expect 0 covariance - a.csv --jobs 2 <"$data"
  [ "$(wc -l <out)" = 2 ] || fail "two lines expected"
  # Files of two lengths and both types, interleaved: each line is the record a
  # run on that file alone prints, double for double, whatever the thread count.
  $py - <<'PY'
import math, random
rng = random.Random(3)
for n in (48, 90):
    for k in range(2):
        w = 0.3 + 0.1 * k
        with open(f"r{n}_{k}.csv", "w") as f:
            for t in range(n):
                v = math.exp(-0.01 * t) * math.cos(w * t) + 0.4 * math.cos(2.2 * t + k)
                f.write("%r\n" % (v + 0.05 * rng.gauss(0, 1)))
        with open(f"c{n}_{k}.csv", "w") as f:
            for t in range(n):
                z = complex(math.cos(w * t), math.sin(w * t)) * math.exp(-0.005 * t)
                z += 0.3 * complex(math.cos(1.4 * t), -math.sin(1.4 * t))
                f.write("%r,%r\n" % (z.real + 0.05 * rng.gauss(0, 1), z.imag))
PY
  mixed=(r48_0.csv c90_0.csv r90_0.csv c48_0.csv r48_1.csv c90_1.csv r90_1.csv c48_1.csv)
  for method in covariance pcar prony pencil mdl covspectrum pcarspectrum stabilization; do
    "$qdm" $method --order 8 --components 4 --modes 4 --nfft 64 --max-order 8 --ignore-unknown \
      --jobs 2 "${mixed[@]}" >batch2.jsonl 2>err || fail "$method --jobs 2: $(cat err)"
    "$qdm" $method --order 8 --components 4 --modes 4 --nfft 64 --max-order 8 --ignore-unknown \
      --jobs 1 "${mixed[@]}" >batch1.jsonl 2>err || fail "$method --jobs 1: $(cat err)"
    cmp -s batch1.jsonl batch2.jsonl || fail "$method: --jobs 1 and --jobs 2 differ"
    for f in "${mixed[@]}"; do
      "$qdm" $method --order 8 --components 4 --modes 4 --nfft 64 --max-order 8 \
        --ignore-unknown --json "$f" >"one_$f.json" 2>err || fail "$method $f: $(cat err)"
    done
    $py - "${mixed[@]}" <<'PY' || fail "$method: the batch lines differ from one-file runs"
import json, sys
lines = open("batch2.jsonl").read().splitlines()
assert len(lines) == len(sys.argv) - 1, len(lines)
for line, name in zip(lines, sys.argv[1:]):
    one = json.load(open(f"one_{name}.json"))
    # repr of every double (and -0.0) survives dumps: equal text is equal bits.
    assert json.dumps(json.loads(line)) == json.dumps(one), (name, line[:200])
    assert one["status"] == 0 and one["input"] == name, one
PY
    echo "ok: $method: --jobs 1, --jobs 2 and one-file runs agree on ${#mixed[@]} files"
  done
  # A NaN, an infinity and an all-zero file among good ones of the same length:
  # their own error lines, each naming its sample, exit 2; the others complete.
  $py - <<'PY'
import math
for name, bad in (("nan1.csv", {7: "nan"}), ("nan2.csv", {30: "nan"}), ("inf.csv", {12: "-inf"})):
    with open(name, "w") as f:
        for t in range(48):
            f.write(bad.get(t, "%r" % math.cos(0.5 * t)) + "\n")
open("zeros48.csv", "w").write("0\n" * 48)
PY
  "$qdm" pencil --modes 4 --jobs 2 r48_0.csv nan1.csv zeros48.csv r48_1.csv inf.csv nan2.csv \
    c48_0.csv >out 2>err; rc=$?
  [ $rc = 2 ] && [ "$(wc -l <err)" = 4 ] || fail "bad records: exit $rc, $(cat err)"
  $py - out <<'PY' || fail "bad records: $(cat out)"
import json, sys
lines = [json.loads(l) for l in open(sys.argv[1])]
got = [(l["input"], l["status"], l.get("exit", 0)) for l in lines]
assert [g[0] for g in got] == ["r48_0.csv", "nan1.csv", "zeros48.csv", "r48_1.csv", "inf.csv",
                               "nan2.csv", "c48_0.csv"], got
assert [g[2] for g in got] == [0, 1, 2, 0, 1, 1, 0], got
assert got[1][1] == got[4][1] == got[5][1] == -42419 and got[2][1] < 0, got
for i, words in ((1, "x[7] is not finite: nan"), (4, "x[12] is not finite: -inf"),
                 (5, "x[30] is not finite: nan")):
    assert lines[i]["error"] == (lines[i]["input"] + ": qdm_matrix_pencil_solver_real returned "
                                 "-42419: " + words), lines[i]
assert "x[" not in lines[2]["error"] and lines[2]["error"].startswith("zeros48.csv: "), lines[2]
assert all(len(lines[i]["results"]["modes"]["frequency_hz"]) == 4 for i in (0, 3, 6)), lines
PY
  for f in nan1.csv zeros48.csv inf.csv nan2.csv; do
    "$qdm" pencil --modes 4 "$f" 2>one.err >/dev/null
    grep -qxF "$(cat one.err)" err || fail "$f: the batch words it otherwise: $(cat one.err)"
  done
  echo "ok: NaN, infinite and all-zero records fail alone, worded as one-file runs"
  # An order too large for one group's length: each file of that group names
  # it (exit 1 in its line), the other group is fitted.
  "$qdm" covariance --order 40 --jobs 2 r48_0.csv r90_0.csv c48_1.csv r48_1.csv >out 2>err; rc=$?
  [ $rc = 2 ] && [ "$(wc -l <err)" = 3 ] || fail "group refusal: exit $rc, $(cat err)"
  $py - out <<'PY' || fail "group refusal: $(cat out)"
import json, sys
lines = [json.loads(l) for l in open(sys.argv[1])]
assert [l.get("exit", 0) for l in lines] == [1, 0, 1, 1], lines
words = "order 40 is above floor(2n/3) = 32 (n = 48)"
assert lines[0]["error"] == "r48_0.csv: qdm_covariance_real returned -42412: " + words, lines[0]
assert lines[2]["error"] == "c48_1.csv: qdm_covariance_complex returned -42412: " + words
assert lines[3]["status"] == -42412 and words in lines[3]["error"], lines[3]
assert len(lines[1]["results"]["coefficients"]) == 41, lines[1]
PY
  echo "ok: an order too large for n = 48 refused on each of its files"
  # More files than one chunk holds: every line, in input order.
  $py - <<'PY'
import math, os
os.makedirs("many", exist_ok=True)
for i in range(4200):
    with open(f"many/{i:04d}.csv", "w") as f:
        f.write("".join("%.6f\n" % math.sin(0.7 * t + i) for t in range(8 + i % 3)))
PY
  "$qdm" covariance --order 2 --jobs 2 many/*.csv >out 2>err || fail "many files: $(head -3 err)"
  $py - out <<'PY' || fail "many files: $(head -c 300 out)"
import json, sys
lines = [json.loads(l) for l in open(sys.argv[1])]
assert [l["input"] for l in lines] == [f"many/{i:04d}.csv" for i in range(4200)]
assert [l["signal"]["samples"] for l in lines] == [8 + i % 3 for i in range(4200)]
PY
  echo "ok: 4200 files in input order"
  ;;
readme)
  # The first screen's tool commands and Python example run as written, from a
  # copy of the repository's test data, with the installed tool and library.
  mkdir -p tests && ln -sfn "$(dirname "$data")" tests/data
  $py - "$readme" >commands.sh <<'PY'
import sys
text = open(sys.argv[1], encoding="utf-8").read()
section = text.split("\n## The command-line tool\n", 1)[1].split("\n## ", 1)[0]
lines = section.split("```sh\n", 1)[1].split("\n```", 1)[0].splitlines()
assert len(lines) >= 4, lines
print("set -e\n" + "\n".join(lines))
PY
  PATH=$prefix/bin:$PATH bash commands.sh >commands.out 2>err || fail "README commands: $(cat err)"
  [ ! -s err ] || fail "README commands wrote to stderr: $(cat err)"
  [ -s modes.png ] && [ "$(ls records/*.csv | wc -l)" = 2 ] || fail "README commands: no picture or records"
  [ "$(wc -l <fits.jsonl)" = 2 ] || fail "README: one JSON line per record expected"
  echo "ok: README tool commands: $(wc -l <commands.sh) lines"
  $py - "$readme" >example.py <<'PY'
import sys
text = open(sys.argv[1], encoding="utf-8").read()
print(text.split("\n## Python\n", 1)[1].split("```python\n", 1)[1].split("```", 1)[0])
PY
  lib=$(find "$prefix" -name 'libqdm_api.so.1' | head -1)
  LD_PRELOAD=${QDM_PYTHON_PRELOAD:-} ASAN_OPTIONS=detect_leaks=0 QDM_LIBRARY=$lib \
    PYTHONPATH=$(dirname "$readme")/python $py example.py 2>err \
    || fail "README Python example: $(cat err)"
  echo "ok: README Python example"
  ;;
argument_words)
  # A refused value is named with its value and the limit it broke, in one line.
  while IFS='|' read -r args words; do
    # shellcheck disable=SC2086
    expect 1 $args
    grep -qF -- "$words" err || fail "qdm $args: expected '$words' in: $(cat err)"
  done <<'EOF'
covariance --example real --order 300|qdm_covariance_real returned -42412: order 300 is above floor(2n/3) = 85 (n = 128)
pcar --example complex --order 8 --components 9|returned -42413: components 9 is above order = 8
pencil --example complex --pencil 10 --modes 11|returned -42413: order 11 is above pencil = 10
mdl --example real --pencil 3 --min-order 3|returned -42415: pencil 3 is not above min_order = 3
prony --example real --rate -5|returned -42418: fs -5 is not positive
covspectrum --example real --order 40 --nfft 20|returned -42422: points 20 gives fewer spectrum values than order + 1 = 41
EOF
  ;;
exit_codes)
  # Every command in README's exit-status table gives the code of its row.
  root=$(dirname "$readme")
  rows=$($py - "$readme" <<'PY'
import re, sys
text = open(sys.argv[1], encoding="utf-8").read()
section = text.split("## The command-line tool: `qdm`", 1)[1].split("\n## ", 1)[0]
table = section.split("| code | meaning |", 1)[1]
for line in table.splitlines():
    cells = [c.strip() for c in re.split(r"(?<!\\)\|", line)]
    if len(cells) == 5 and cells[1].isdigit():
        for command in re.findall(r"`([^`]+)`", cells[3]):
            print(cells[1] + "\t" + command.replace("\\|", "|"))
PY
)
  [ "$(cut -f1 <<<"$rows" | sort -u | tr -d '\n')" = 0123 ] || fail "table rows: $rows"
  while IFS=$'\t' read -r want command; do
    (cd "$root" && PATH=$prefix/bin:$PATH bash -c "$command" >/dev/null 2>"$work/err")
    rc=$?
    [ "$rc" = "$want" ] || fail "README: $command exited $rc, not $want: $(cat err)"
    [ "$want" = 0 ] || [ "$(grep -c '^qdm: ' err)" -ge 1 ] || fail "README: $command: $(cat err)"
    echo "ok: README: $command -> $rc"
  done <<<"$rows"
  expect 0 --version
  grep -q '^qdm [0-9]' out || fail "--version: $(cat out)"
  expect 0 pencil --help
  # Usage and values: 1, with the library's status in the message when it refused.
  printf '1,2\n3\n' >ragged.csv
  while read -r status args; do
    # shellcheck disable=SC2086
    expect 1 $args
    [ "$status" = - ] || grep -q -- "$status" err || fail "status $status missing: $(cat err)"
  done <<EOF
- fourier
- covariance --order twelve $data
- covariance no_such_file.csv
- covariance ragged.csv
-42412 covariance --order 0 $data
-42418 pencil --rate 0 $data
-42417 covspectrum --nfft 1 $data
-42417 covspectrum --points 1 $data
-42411 pencil --pencil 60 $data
- pencil --solver lanczos $data
- pcar --solver lanczos $data
EOF
  expect 1
  # An option of another method is an error that names it, unless --ignore-unknown.
  expect 1 pencil --nfft 8 --upper 3 "$data"
  grep -q -- "--nfft does not apply to pencil" err || fail "option not named: $(cat err)"
  expect 0 pencil --nfft 8 --upper 3 --ignore-unknown "$data"
  # Both routes of the pencil give the same modes (7 significant digits shown).
  expect 0 pencil --solver dense --modes 4 --pencil 20 "$data" && sed 1,2d out >dense.txt
  expect 0 pencil --solver krylov --modes 4 --pencil 20 "$data" && sed 1,2d out >krylov.txt
  diff dense.txt krylov.txt >/dev/null || fail "routes differ: $(diff dense.txt krylov.txt)"
  # And so do both routes of PCAR (the parameters line names the route).
  expect 0 pcar --solver dense --order 30 --components 4 "$data" && sed 1,2d out >dense.txt
  expect 0 pcar --solver krylov --order 30 --components 4 "$data" && sed 1,2d out >krylov.txt
  diff dense.txt krylov.txt >/dev/null || fail "PCAR routes differ: $(diff dense.txt krylov.txt)"
  # A missing or empty value names its option, whether or not the method uses it.
  for option in --order --rate --nfft --column --delimiter; do
    expect 1 pencil "$data" $option
    grep -q -- "$option" err || fail "$option not named: $(cat err)"
  done
  expect 1 covariance "$data" --order ''
  grep -q -- '--order' err || fail "--order '' not named: $(cat err)"
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
  expect 1 mdl --example --plot m.png
  # A name with a control byte is refused before anything runs.
  evil=$'a.png\nsystem "touch PWNED"\n#'
  expect 3 pencil "$data" --plot "$evil"
  [ ! -e PWNED ] && [ ! -e "$evil" ] || fail "the refused name ran or was written"
  if command -v gnuplot >/dev/null; then
    # The hole this closes: were either name text in gnuplot's script, PWNED would exist.
    for quote in "'" '"'; do
      name="x$quote"$'\nsystem "touch PWNED"\nprint '"$quote"'.csv'
      cp "$data" "$name"
      for method in pencil covspectrum covariance stabilization; do
        expect 0 $method "$name" --plot "b$quote.png"
        [ ! -e PWNED ] || fail "gnuplot ran a command from the input's name"
        [ "$(head -c 4 "b$quote.png" | tail -c 3)" = PNG ] || fail "no PNG for a hostile name"
      done
    done
    expect 0 pcarspectrum --example --real-signal --plot spectrum.png
    # The diagram: JSON of one row per pole and the MDL order, and its picture.
    expect 0 stabilization --example --real-signal --max-order 14 --json --plot diagram.png
    python3 -c 'import json, sys
r = json.load(open(sys.argv[1]))["results"]; d = r["diagram"]
assert set(d) == {"order", "frequency_hz", "damping_per_sample", "damping_per_s", "amplitude",
                  "flags", "stable"}, d.keys()
assert len({len(c) for c in d.values()}) == 1 and len(d["order"]) == r["pole_count"]
assert d["order"][0] == 1 and d["order"][-1] == 14 and d["order"] == sorted(d["order"])
assert all(s == (f >> 2) & 1 for s, f in zip(d["stable"], d["flags"]))
assert 0 < r["stable_count"] == sum(d["stable"]) and 1 <= r["mdl_order"] <= 14' out \
      || fail "stabilization JSON: $(head -c 300 out)"
    [ "$(head -c 4 diagram.png | tail -c 3)" = PNG ] || fail "no diagram drawn"
    expect 1 stabilization --example --max-order 14 --freq-tol -1
    grep -q 'freq_tol -1 is below 0' err || fail "tolerance refusal: $(cat err)"
    [ "$(head -c 4 spectrum.png | tail -c 3)" = PNG ] || fail "no PNG drawn"
    expect 3 covariance --example --plot "$work/no_such_dir/x.png"
    expect 3 pencil --example --plot /dev/full
    grep -q 'No space' err || fail "/dev/full: $(cat err)"
  fi
  ;;
csv)
  # CSV as people write it: generated files, the options, the exit code and what is read.
  $py - <<'PY'
import math
x = [math.sin(0.3 * i) + 0.5 * math.cos(0.71 * i) for i in range(256)]
def put(name, lines, encoding="utf-8"):
    open(name, "w", encoding=encoding).write("".join(l + "\n" for l in lines))
put("bom.csv", ["%r" % v for v in x], "utf-8-sig")
put("bomheader.csv", ["value"] + ["%r" % v for v in x], "utf-8-sig")
put("huge_first.csv", ["1e400"] + ["%r" % v for v in x])
put("hex_first.csv", ["0x1p3"] + ["%r" % v for v in x])
put("huge_later.csv", ["%r" % v for v in x] + ["1e400"])
put("decimal_comma.csv", [("%.4f" % v).replace(".", ",") for v in x])
put("year.csv", ["year,value"] + ["%d,%r" % (1766 + i, v) for i, v in enumerate(x)])
put("index.csv", [",value"] + ["%d,%r" % (i, v) for i, v in enumerate(x)])
put("index_noheader.csv", ["%d,%r" % (i, v) for i, v in enumerate(x)])
put("reim.csv", ["re,im"] + ["%r,%r" % (v, -v) for v in x])
put("iq.csv", ["I;Q"] + [("%r;%r" % (v, -v)).replace(".", ",") for v in x])
put("noheader2.csv", ["%r,%r" % (v, -v) for v in x])
put("three.tsv", ["t\tre\tim"] + ["%d\t%r\t%r" % (i, v, -v) for i, v in enumerate(x)])
put("blanks.txt", ["%r   \t%r" % (v, -v) for v in x])
put("quoted.csv", ['"","x"'] + ['"%d",%r' % (i + 1, v) for i, v in enumerate(x)])
put("dup.csv", ["a,a"] + ["%r,%r" % (v, v) for v in x])
PY
  while read -r rc type n file args; do
    # shellcheck disable=SC2086
    expect "$rc" covariance --order 4 --json "$file" $args
    [ "$rc" != 0 ] || samples "$type" "$n"
  done <<'EOF'
0 real 256 bom.csv
0 real 256 bomheader.csv
1 - - huge_first.csv
1 - - hex_first.csv
1 - - huge_later.csv
1 - - decimal_comma.csv
0 real 256 decimal_comma.csv --delimiter ;
1 - - year.csv
0 real 256 year.csv --column 2
0 real 256 year.csv --column value
1 - - index.csv
0 real 256 index.csv --column value
1 - - index_noheader.csv
0 real 256 index_noheader.csv --column 2
0 complex 256 index_noheader.csv --columns 1,2
0 complex 256 reim.csv
0 complex 256 iq.csv --delimiter ;
0 complex 256 noheader2.csv
0 real 256 noheader2.csv --column 2
1 - - three.tsv --delimiter tab
0 complex 256 three.tsv --delimiter tab --columns re,im
0 complex 256 three.tsv --delimiter tab --columns 2,3
1 - - three.tsv --delimiter tab --column 4
1 - - three.tsv --delimiter tab --column nope
1 - - three.tsv --delimiter tab --columns 1,2,3
1 - - noheader2.csv --column x
0 complex 256 blanks.txt --delimiter space
1 - - blanks.txt
0 real 256 quoted.csv --column x
1 - - dup.csv --column a
1 - - bom.csv --delimiter x
EOF
  # The errors name the line and the field.
  expect 1 covariance huge_first.csv
  grep -q "huge_first.csv:1: field 1 '1e400' is out of the range" err || fail "$(cat err)"
  expect 1 covariance hex_first.csv
  grep -q "hex_first.csv:1: field 1 '0x1p3' is not a number" err || fail "$(cat err)"
  expect 1 covariance huge_later.csv
  grep -q "huge_later.csv:257: field 1 '1e400'" err || fail "$(cat err)"
  ;;
limits)
  # Hostile input: bounded, and every failure is one line and a documented code.
  { echo 1; echo 2; head -c 200000 /dev/zero | tr '\0' 7; echo x; } >long_field.csv
  expect 1 covariance long_field.csv
  [ "$(wc -c <err)" -lt 300 ] || fail "the field is echoed whole: $(wc -c <err) bytes"
  grep -q "long_field.csv:3: field 1 '7\{40\}\.\.\.' is not a number" err || fail "$(cat err)"
  { head -c 2000000 /dev/zero | tr '\0' 7; echo; } >long_line.csv
  expect 1 covariance long_line.csv
  printf '1\n2\nab\0cd\n3\n' >nul.csv
  expect 1 covariance nul.csv
  grep -q 'nul.csv:3: a NUL byte' err || fail "$(cat err)"
  printf '1\n2\n\xc2\x85\x1b[31m\xff\n' >ctl.csv
  expect 1 covariance --json ctl.csv
  grep -q "'\\\\xc2\\\\x85\\\\x1b\[31m\\\\xff'" err || fail "control bytes not escaped: $(cat -v err)"
  $py -c 'import json; json.load(open("out"))' || fail "error record is not JSON: $(cat out)"
  printf '1\n2\n\xe9t\xe9\n' >l1.csv
  expect 1 covariance l1.csv --json
  $py -c 'import json; r = json.load(open("out")); assert r["exit"] == 1, r' || fail "$(cat out)"
  cp "$data" $'name\xff.csv'
  expect 0 covariance $'name\xff.csv' --json
  $py -c 'import json; assert json.load(open("out"))["input"] == "name\ufffd.csv"' || fail "$(cat out)"
  seq 1 2000 >seq.csv
  expect 1 covariance seq.csv --max-input-bytes 1KiB
  grep -q 'more than 1024 bytes' err || fail "$(cat err)"
  expect 0 covariance seq.csv --max-input-bytes 9KiB
  expect 1 covariance seq.csv --max-input-bytes 0
  # Under a 2 GB address-space limit: one line and a documented code, never a signal.
  # (AddressSanitizer reserves terabytes of address space: no such run with it.)
  # (grep reads all of ldd's output: with pipefail, grep -q could end the pipe early.)
  if ldd "$qdm" | grep libasan >/dev/null; then echo "passed: $case (AddressSanitizer: no limits run)"; exit 0; fi
  while read -r args; do
    # shellcheck disable=SC2086
    timeout 60 prlimit --as=2000000000 "$qdm" $args >/dev/null 2>err </dev/zero; rc=$?
    [ $rc -le 3 ] && [ $rc -ge 1 ] && [ "$(wc -l <err)" = 1 ] && grep -q '^qdm: ' err \
      || fail "qdm $args under 2 GB: exit $rc, $(head -c 300 err)"
    echo "ok: 2 GB: qdm $args -> $rc $(cat err)"
  done <<EOF
covspectrum $data --nfft 67108864 --csv
covspectrum $data --nfft 67108864 --json
pcarspectrum $data --nfft 536870912
covspectrum $data --nfft 1073741824
pencil /dev/zero
pencil -
pencil /dev/zero --max-input-bytes 4EiB
covariance l1.csv --json
covariance long_field.csv --json
covariance --order 0 --rate 0 $data
EOF
  # A refused spectrum size costs no memory: the library refuses before it is touched.
  kib=$($py - "$qdm" "$data" <<'PY'
import resource, subprocess, sys
r = subprocess.run([sys.argv[1], "covspectrum", sys.argv[2], "--nfft", "536870912"],
                   capture_output=True, text=True)
assert r.returncode == 1 and "-42420" in r.stderr, (r.returncode, r.stderr)
print(resource.getrusage(resource.RUSAGE_CHILDREN).ru_maxrss)
PY
) || fail "--nfft 536870912: $kib"
  [ "$kib" -lt 200000 ] || fail "--nfft 536870912 used $kib KiB"
  echo "ok: --nfft 536870912 refused with -42420, peak $kib KiB"
  ;;
present)
  # What a reader of the outputs meets: units, sorted modes, one-sided spectra, plain arrays.
  $py - <<'PY'
import numpy as np
rng = np.random.default_rng(11)
e, x = rng.standard_normal(60500), np.zeros(60500)
for t in range(2, len(e)):   # AR(2), poles 0.9 exp(+-0.6j)
    x[t] = e[t] + 1.8 * np.cos(0.6) * x[t - 1] - 0.81 * x[t - 2]
np.savetxt("ar2.csv", x[500:])
print(np.var(x[500:]), file=open("ar2.var", "w"))
PY
  # The density integrates over 0..fs/2 to the record's variance (5%), at any rate.
  for rate in 1 250; do
    expect 0 covspectrum ar2.csv --order 2 --nfft 4096 --rate $rate --json
    $py - "$rate" <<'PY' || fail "density at rate $rate: $(head -c 300 out)"
import json, sys
r = json.load(open("out"))
s, fs = r["results"]["spectrum"], float(sys.argv[1])
assert r["parameters"]["one_sided"] == 1 and s["one_sided"] is True
assert s["length"] == 2049 == len(s["frequency_hz"]) == len(s["psd_per_hz"]) == len(s["power_db"])
assert s["frequency_hz"][0] == 0.0 and s["frequency_hz"][-1] == fs / 2
power = sum(s["psd_per_hz"]) * fs / 4096
variance = float(open("ar2.var").read())
assert abs(power / variance - 1) < 0.05, (power, variance)
PY
  done
  expect 0 covspectrum ar2.csv --order 2 --nfft 64 --csv
  [ "$(head -1 out)" = frequency_hz,power_db,psd_per_hz ] && [ "$(wc -l <out)" = 34 ] \
    || fail "one-sided CSV: $(head -2 out)"
  expect 0 covspectrum ar2.csv --order 2 --nfft 64 --csv --two-sided
  [ "$(sed -n 2p out | cut -d, -f1)" = -0.5 ] && [ "$(wc -l <out)" = 65 ] || fail "two-sided CSV"
  expect 0 pcarspectrum --example --real-signal --csv
  [ "$(head -1 out)" = frequency_hz,power_db ] && [ "$(wc -l <out)" = 258 ] || fail "PCAR CSV"
  # Modes: sorted by frequency, damping per sample and per second, plain arrays;
  # --no-sort gives the same rows in the library's order.
  for method in pencil prony pcarspectrum; do
    expect 0 $method --example --json && cp out sorted.json
    expect 0 $method --example --json --no-sort && cp out raw.json
    $py - $method <<'PY' || fail "$method modes: $(head -c 400 sorted.json)"
import json, sys
s, r = (json.load(open(f))["results"]["modes"] for f in ("sorted.json", "raw.json"))
names = ["frequency_hz", "amplitude", "phase_rad"]
if sys.argv[1] != "pcarspectrum":
    names += ["damping_per_sample", "damping_per_s"]
    names += [k + "_stderr" for k in names]  # each error beside its mode, sorted with it
    assert all(abs(b - a * 1000) <= 1e-9 * abs(b)
               for a, b in zip(s["damping_per_sample"], s["damping_per_s"]))
    assert all(0 < e < abs(d) for e, d in zip(s["damping_per_sample_stderr"],
                                             s["damping_per_sample"]))
assert list(s) == names and all(isinstance(v, float) for v in s["frequency_hz"]), s
assert s["frequency_hz"] == sorted(s["frequency_hz"]) != r["frequency_hz"], s
rows = lambda m: sorted(zip(*(m[k] for k in names)))
assert rows(s) == rows(r)
PY
  done
  expect 0 pencil --example --real-signal
  grep -q 'damping_per_s' out && grep -q 'frequency_hz' out || fail "table columns: $(cat out)"
  grep -Eq ' 119\.9[0-9]* \+- 0\.0[0-9]+ ' out || fail "no error beside the 120 Hz mode: $(cat out)"
  # Too few samples for the errors: the fit stands, its errors are null, a warning says why.
  printf '1\n0.5\n-0.2\n-0.9\n-0.4\n0.3\n' >six.csv
  expect 0 prony six.csv --order 4 --json
  grep -q "warning: standard errors: too few samples" err || fail "no error-bar warning: $(cat err)"
  $py -c 'import json; m = json.load(open("out"))["results"]["modes"]; assert len(m["amplitude"]) == 4 and m["frequency_hz_stderr"] == [None] * 4, m' \
    || fail "errors of a short record: $(head -c 300 out)"
  expect 0 covariance --example --order 4 --json
  $py -c 'import json; c = json.load(open("out"))["results"]["coefficients"]; assert c[0] == 1.0 and len(c) == 5, c' \
    || fail "real coefficients: $(head -c 300 out)"
  expect 0 pcar --example complex --order 4 --components 2 --json
  $py -c 'import json; c = json.load(open("out"))["results"]["coefficients"]; assert list(c) == ["re", "im"] and len(c["im"]) == 5, c' \
    || fail "complex coefficients: $(head -c 300 out)"
  # Options that do not fit the data or the method: exit 1, one line naming them.
  while read -r named args; do
    # shellcheck disable=SC2086
    expect 1 $args
    grep -q -- "$named" err || fail "$named not named: $(cat err)"
  done <<'CASES'
--real-signal pencil --example complex --real-signal
--real-signal prony --example complex --real-signal
--one-sided covspectrum --example complex --one-sided
--one-sided pcarspectrum --example complex --one-sided
--two-sided covspectrum --example --one-sided --two-sided
--modes covariance --example --modes 4
--no-sort covariance --example --no-sort
--rate mdl --example --rate 100
--solver prony --example --solver dense
--one-sided pencil --example --one-sided
--components covspectrum --example --components 2
--plot mdl --example --plot m.png
CASES
  expect 0 covariance --example --modes 4 --no-sort --rate 100 --ignore-unknown
  expect 0 covspectrum --example complex --two-sided
  [ ! -e m.png ] || fail "mdl drew a picture"
  ;;
defaults)
  # The tool and the Python package both take the library's default upper order
  # of the MDL search: on the same files they choose the same order. The long
  # noisy record is one whose order depends on that bound.
  api=$(find "$prefix" -name 'libqdm_api.so' | head -n 1)
  [ -n "$api" ] || fail "no libqdm_api.so under $prefix"
  $py - <<'PY' || fail "long record"
import math, random
rng = random.Random(7)
with open("long.csv", "w") as f:
    for t in range(600):
        v = sum(math.exp(-0.002 * t) * math.cos(0.3 * k * t + k) for k in range(1, 8))
        f.write("%.17g\n" % (v + 0.3 * rng.gauss(0.0, 1.0)))
PY
  for file in "$data" long.csv; do
    expect 0 mdl "$file" --json
    LD_PRELOAD=${QDM_PYTHON_PRELOAD:-} ASAN_OPTIONS=detect_leaks=0 QDM_LIBRARY=$api \
      PYTHONPATH=$(dirname "$readme")/python $py - "$file" <<'PY' ||
import json, sys
import numpy as np
import qdm
a = np.loadtxt(sys.argv[1], delimiter=",", ndmin=2)
x = a[:, 0] + 1j * a[:, 1] if a.shape[1] == 2 else a[:, 0]
tool = json.load(open("out"))
assert tool["results"]["order"] == qdm.mdl_order(x), (tool, qdm.mdl_order(x))
print("ok: %s: order %d, pencil %d" % (sys.argv[1], qdm.mdl_order(x), tool["parameters"]["pencil"]))
PY
      fail "the tool and Python differ on $file: $(cat out)"
  done
  ;;
*) fail "unknown case $case" ;;
esac
echo "passed: $case"
