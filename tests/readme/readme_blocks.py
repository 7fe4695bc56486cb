#!/usr/bin/python3
"""Every code block of README.md is run as written, or is listed below with
what runs it.

    readme_blocks.py list README
    readme_blocks.py check README SOURCE BUILD PREFIX WORK [--no-bench]
    readme_blocks.py install README SOURCE WORK
    readme_blocks.py run-for RUNNER README

A block is a fenced block (```) or an indented one (four spaces after a blank
line). The fence's info string says what it is:

    sh      shell commands, run with bash -e -o pipefail from the repository root
    python  a Python program, run with /usr/bin/python3 from the repository root
    c       a C program; a comment in it names how to build and run it
            ("Build: cc FILE.c ..." and "Run: ./a.out ..."), and both are run
    text    output, a synopsis or a table: never run

An indented block, a fence without an info string or with another one fails
`check`, as does a sh block that neither runs nor is in ELSEWHERE, naming the
README line and the block's first line, so that no new block goes untested.

`check` (ctest readme.blocks) copies the repository to WORK, points
WORK/build/release at the build tree under test (and WORK/build/bench at its
benchmarks), puts the installed tool of PREFIX first on PATH, its qdm.pc on
PKG_CONFIG_PATH and the package in WORK/python on PYTHONPATH, and runs every
block in README order in that one directory, as a reader following the README
would. `install` (ctest readme.install, as root) runs the blocks ELSEWHERE
gives to readme.install in a copy of the repository, installing into
/usr/local as the README says, checks what they leave and removes what they
installed. `run-for` runs the blocks ELSEWHERE gives to RUNNER in the current
directory (scripts/windows.sh uses it).
"""
import collections
import os
import re
import shutil
import subprocess
import sys

Block = collections.namedtuple("Block", "line info text indented")
# first line -> (what runs the block as written, why not here, lines run here)
Elsewhere = collections.namedtuple("Elsewhere", "runner why here")
INSTALL = "readme.install"

ELSEWHERE = {
    "scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \\":
        Elsewhere(INSTALL, "builds build/release with the tests off and installs into "
                  "/usr/local: run in a copy of the repository, as root", ()),
    'cmake -S . -B build/release && cmake --build build/release -j"$(nproc)" --target qdm_api':
        Elsewhere(INSTALL, "reconfigures build/release: run in the install test's copy, "
                  "after its install block, with HOME in the test's directory", ()),
    "./scripts/run-example.sh":
        Elsewhere(INSTALL, "the main job builds build/release: run in the install "
                  "test's copy, after its install block", ()),
    "./scripts/test.sh":
        Elsewhere(".ci/run", "the test command itself, which runs this test: CI runs "
                  "exactly it", ()),
    "./scripts/windows.sh":
        Elsewhere("scripts/test.sh", "the Windows build and its tests under wine "
                  "(about 5 minutes warm): the test command's last step runs it", ()),
    "WINEPREFIX=$PWD/build/windows/wineprefix WINEDEBUG=-all \\":
        Elsewhere("scripts/windows.sh", "needs the Windows build and its wine prefix: "
                  "scripts/windows.sh runs it after its tests", ()),
    "../shared/tools/mutants.py --count 80 --seed 11    # from the repository root":
        Elsewhere(None, "the mutation tool is kept outside this repository, and a run "
                  "rebuilds and runs the suite 80 times (hours)", ()),
    "cmake -S . -B build -DCMAKE_BUILD_TYPE=Release -DQDM_BUILD_BENCH=ON":
        Elsewhere(None, "a full table takes over ten minutes; the build tree under test "
                  "stands in for `build` (every test.sh tree builds the benchmarks)",
                  ("./build/bench/fft_bench --only 1763 --quick   # one length, shorter batches",)),
    "cmake -S . -B build/release -DCMAKE_BUILD_TYPE=Release -DQDM_BUILD_BENCH=ON":
        Elsewhere(None, "a benchmark run takes several minutes per BLAS and builds a "
                  "second tree on the reference BLAS; old.json and new.json stand for "
                  "two earlier `run --json` outputs", ()),
}


def blocks(readme):
    """The README's code blocks, with their first line's number (from 1)."""
    lines = open(readme, encoding="utf-8").read().split("\n")
    found, i, blank = [], 0, True
    while i < len(lines):
        line = lines[i]
        fence = re.match(r"^(`{3,}|~{3,})\s*(\S*)", line)
        if fence:
            start, close = i, fence.group(1)
            i += 1
            while i < len(lines) and not lines[i].startswith(close):
                i += 1
            found.append(Block(start + 2, fence.group(2), "\n".join(lines[start + 1:i]), False))
            i, blank = i + 1, False
            continue
        if blank and line.startswith("    ") and line.strip():
            start = i
            while i < len(lines) and (lines[i].startswith("    ") or (
                    not lines[i].strip() and i + 1 < len(lines) and lines[i + 1].startswith("    "))):
                i += 1
            found.append(Block(start + 1, "", "\n".join(l[4:] for l in lines[start:i]), True))
            blank = False
            continue
        blank = not line.strip()
        i += 1
    return found


def first_line(block):
    return block.text.split("\n", 1)[0]


def commands(text):
    """The block's shell commands, backslash continuations joined."""
    out, pending = [], ""
    for line in text.split("\n"):
        pending += line
        if line.endswith("\\"):
            pending += "\n"
            continue
        if pending.strip():
            out.append(pending)
        pending = ""
    return out


def where(block):
    return f"README.md:{block.line}: {first_line(block)[:70]!r}"


def run(argv, cwd, env, timeout=900, stdin=subprocess.DEVNULL):
    """Runs argv; returns (exit status, the tail of its output)."""
    try:
        p = subprocess.run(argv, cwd=cwd, env=env, stdin=stdin, stdout=subprocess.PIPE,
                           stderr=subprocess.STDOUT, timeout=timeout)
    except subprocess.TimeoutExpired:
        return "timed out", ""
    out = p.stdout.decode("utf-8", "replace")
    return p.returncode, "\n".join(out.rstrip("\n").split("\n")[-15:])


def shell(text, cwd, env):
    return run(["bash", "-e", "-o", "pipefail", "-c", text], cwd, env)


def run_block(block, cwd, env):
    """Runs one block as written; returns a failure's description or None."""
    if block.info == "sh":
        rc, tail = shell(block.text, cwd, env)
    elif block.info == "python":
        path = os.path.join(cwd, f"readme_{block.line}.py")
        open(path, "w", encoding="utf-8").write(block.text + "\n")
        rc, tail = run(["/usr/bin/python3", path], cwd, env)
    elif block.info == "c":
        build = re.search(r"\bBuild:\s*(.+)", block.text)
        start = re.search(r"\bRun:\s*(.+?)\s*(\*/)?$", block.text, re.M)
        source = build and re.search(r"(\S+\.c)\b", build.group(1))
        if not (build and start and source):
            return "a C block names how it is built and run: 'Build: cc FILE.c ...', 'Run: ...'"
        open(os.path.join(cwd, source.group(1)), "w", encoding="utf-8").write(block.text + "\n")
        rc, tail = shell(build.group(1) + "\n" + start.group(1), cwd, env)
    else:
        return f"info string {block.info!r} is none of sh, python, c, text"
    return None if rc == 0 else f"exit {rc}:\n{tail}"


def check_table(found):
    """Table entries whose block is gone, or whose lines run here are gone."""
    firsts = {first_line(b): b for b in found}
    errors = []
    for key, entry in ELSEWHERE.items():
        if key not in firsts:
            errors.append(f"ELSEWHERE lists a block no longer in README.md: {key!r}")
        else:
            for line in entry.here:
                if line not in commands(firsts[key].text):
                    errors.append(f"{where(firsts[key])}: no line {line!r} in it to run")
    return errors


def copy_source(source, dest, keep=()):
    """dest becomes a copy of the repository (mtimes kept, so a build tree kept
    in it rebuilds only what changed); build/, .git and KEEP are left alone."""
    skip = {"build", ".git"}
    os.makedirs(dest, exist_ok=True)
    for name in os.listdir(dest):
        if name not in keep:
            path = os.path.join(dest, name)
            shutil.rmtree(path) if os.path.isdir(path) and not os.path.islink(path) else os.remove(path)
    avoid = os.path.realpath(dest)
    for name in os.listdir(source):
        path = os.path.join(source, name)
        if name in skip or os.path.realpath(path) == avoid:
            continue
        if os.path.isdir(path):
            shutil.copytree(path, os.path.join(dest, name), symlinks=True, dirs_exist_ok=True,
                            ignore=lambda d, names: [n for n in names if n == "__pycache__"])
        else:
            shutil.copy2(path, dest)


def check(readme, source, build, prefix, work, bench):
    found = blocks(readme)
    errors = check_table(found)
    shutil.rmtree(work, ignore_errors=True)
    copy_source(source, work)
    os.makedirs(os.path.join(work, "build"), exist_ok=True)
    os.symlink(build, os.path.join(work, "build", "release"))
    os.symlink(os.path.join(build, "bench"), os.path.join(work, "build", "bench"))
    os.makedirs(os.path.join(work, "home"))
    pc = [os.path.join(d, f) for d, _, fs in os.walk(prefix) for f in fs if f == "qdm.pc"]
    lib = [os.path.join(d, f) for d, _, fs in os.walk(prefix) for f in fs if f == "libqdm_api.so.1"]
    # The package finds the installed library bundled beside it, as in a wheel
    # (QDM_LIBRARY is left to the commands: the example host reads it too).
    shutil.copy(lib[0], os.path.join(work, "python", "qdm"))
    path = [os.path.join(prefix, "bin"), "/usr/bin", "/bin", os.environ["PATH"]]
    env = dict(os.environ, PATH=os.pathsep.join(path), PKG_CONFIG_PATH=os.path.dirname(pc[0]),
               PYTHONPATH=os.path.join(work, "python"), HOME=os.path.join(work, "home"))
    for var in ("LD_LIBRARY_PATH", "QDM_LIBRARY"):
        env.pop(var, None)
    for block in found:
        entry = ELSEWHERE.get(first_line(block))
        if block.info == "text":
            print(f"output {where(block)}")
        elif entry:
            runner = entry.runner or "no test"
            print(f"{runner}: {where(block)}: {entry.why}")
            for line in entry.here:
                if not bench and "build/bench/" in line:
                    print(f"  not in this tree (built without QDM_BUILD_BENCH): {line}")
                    continue
                rc, tail = shell(line, work, env)
                if rc == 0:
                    print(f"  ran here: {line}")
                else:
                    errors.append(f"{where(block)}: {line}: exit {rc}:\n{tail}")
        elif block.indented or not block.info:
            errors.append(f"{where(block)}: a block with no info string: fence it as ```sh "
                          "(run by this test), ```python, ```c or ```text (output), or list "
                          "it in tests/readme/readme_blocks.py's ELSEWHERE with what runs it")
        else:
            failure = run_block(block, work, env)
            if failure:
                errors.append(f"{where(block)}: {failure}")
            else:
                print(f"ran ({block.info}) {where(block)}")
    for error in errors:
        print("FAIL " + error)
    return 1 if errors else 0


def run_for(runner, readme, cwd, env, after=None):
    """Runs every block ELSEWHERE gives to RUNNER, in README order."""
    found = [b for b in blocks(readme) if (ELSEWHERE.get(first_line(b)) or Elsewhere(0, 0, 0)).runner == runner]
    if not found:
        print(f"FAIL no README block is run by {runner}")
        return 1
    for block in found:
        print(f"== {where(block)}", flush=True)
        failure = run_block(block._replace(info="sh"), cwd, env)
        if after:
            after()
        if failure:
            print(f"FAIL {where(block)}: {failure}")
            return 1
    return 0


def tree(root):
    return {os.path.join(d, n) for d, ds, fs in os.walk(root) for n in ds + fs}


def install(readme, source, work):
    """The install blocks, as root, into /usr/local; removes what they added."""
    if os.geteuid() != 0:
        print("skipped: the README's install block runs as root (it installs into /usr/local)")
        return 77
    usr_local = "/usr/local"
    src = os.path.join(work, "src")
    manifest = os.path.join(src, "build", "release", "install_manifest.txt")
    installed = os.path.join(work, "installed.txt")  # kept until the clean-up is done
    if os.path.exists(installed):  # a run ended before its clean-up
        for path in open(installed).read().split():
            if os.path.lexists(path):
                os.remove(path)
        os.remove(installed)
    mine = os.path.join(usr_local, "bin", "qdm")
    if os.path.lexists(mine):
        print(f"skipped: {mine} is already there, and this test would replace it")
        return 77
    copy_source(source, src, keep=("build",))
    home = os.path.join(work, "home")
    shutil.rmtree(home, ignore_errors=True)
    os.makedirs(home)
    env = dict(os.environ, HOME=home)
    for var in ("LD_LIBRARY_PATH", "PKG_CONFIG_PATH", "PYTHONPATH", "QDM_LIBRARY"):
        env.pop(var, None)
    if shutil.which("ccache"):  # only the compiles are shared; the commands stay as written
        env.update(CMAKE_C_COMPILER_LAUNCHER="ccache", CMAKE_CXX_COMPILER_LAUNCHER="ccache")

    def keep_manifest():
        if os.path.exists(manifest) and open(manifest).read().startswith(usr_local + "/"):
            shutil.copy(manifest, installed)

    before = tree(usr_local)
    try:
        status = run_for(INSTALL, readme, src, env, after=keep_manifest)
        if status == 0:
            status = install_checks(readme, src, home, usr_local)
    finally:
        added = sorted(tree(usr_local) - before, key=len, reverse=True)
        for path in added:
            if os.path.isdir(path) and not os.path.islink(path):
                os.rmdir(path)
            else:
                os.remove(path)
        if os.path.exists(installed):
            os.remove(installed)
        print(f"removed what the blocks added under {usr_local}: {len(added)} paths")
    return status


def install_checks(readme, src, home, usr_local):
    """What the install blocks promise, from a clean environment."""
    env = {"PATH": "/usr/local/bin:/usr/bin:/bin", "HOME": home}
    python = [b for b in blocks(readme) if b.info == "python"][0]
    checks = [
        ("the installed tool runs", ["qdm", "--version"], src),
        ("pkg-config finds it", ["pkg-config", "--libs", "qdm"], src),
        ("the man page", ["test", "-f", f"{usr_local}/share/man/man1/qdm.1"], src),
        ("the package in ~/qdm-env runs the README's Python block",
         [f"{home}/qdm-env/bin/python3", "-c", python.text], src),
        ("the main job's files", ["test", "-s", "build/example/fit.txt", "-a", "-s",
                                  "build/example/fit.json", "-a", "-s", "build/example/spectrum.csv",
                                  "-a", "-s", "build/example/spectrum.png"], src),
    ]
    for what, argv, cwd in checks:
        rc, tail = run(argv, cwd, env)
        if rc != 0:
            print(f"FAIL {what}: {' '.join(argv)[:80]}: exit {rc}\n{tail}")
            return 1
        print(f"ok: {what}")
    return 0


def main(argv):
    if len(argv) == 3 and argv[1] == "list":
        for b in blocks(argv[2]):
            entry = ELSEWHERE.get(first_line(b))
            kind = f"{entry.runner}" if entry else (b.info or "(none)")
            print(f"{b.line:5} {kind:20} {first_line(b)[:70]}")
        return 0
    if len(argv) in (7, 8) and argv[1] == "check":
        return check(*argv[2:7], bench="--no-bench" not in argv)
    if len(argv) == 5 and argv[1] == "install":
        return install(*argv[2:5])
    if len(argv) == 4 and argv[1] == "run-for":
        env = dict(os.environ)
        return run_for(argv[2], argv[3], os.getcwd(), env)
    print(__doc__, file=sys.stderr)
    return 2


if __name__ == "__main__":
    sys.exit(main(sys.argv))
