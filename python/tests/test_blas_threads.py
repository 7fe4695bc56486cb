"""The library shares a process without touching its BLAS: importing qdm leaves
numpy's OpenBLAS thread count as it was, and qdm's results do not depend on it.
Each case runs in a fresh interpreter, so that numpy is loaded before qdm."""
import os
import subprocess
import sys
import textwrap

import pytest

# Finds the OpenBLAS numpy loaded (its libblas.so.3 pulls it in) by the
# process's memory map; prints SKIP when numpy runs on another BLAS.
_PRELUDE = textwrap.dedent("""
    import ctypes, re, sys
    import numpy as np
    maps = open("/proc/self/maps").read()
    paths = sorted(set(re.findall(r"/\\S*libopenblas\\S*\\.so\\S*", maps)))
    if len(paths) != 1:
        print("SKIP numpy's BLAS is not one OpenBLAS:", paths)
        sys.exit(0)
    blas = ctypes.CDLL(paths[0])
    get, put = blas.openblas_get_num_threads, blas.openblas_set_num_threads
""")


def run(body):
    out = subprocess.run([sys.executable, "-c", _PRELUDE + textwrap.dedent(body)],
                         capture_output=True, text=True, env=os.environ, timeout=300)
    assert out.returncode == 0, out.stdout + out.stderr
    if out.stdout.startswith("SKIP"):
        pytest.skip(out.stdout.strip())
    return out.stdout


@pytest.mark.parametrize("numpy_threads", [0, 1, 2, 3])  # 0: as numpy started
def test_import_leaves_numpy_threads_alone(numpy_threads):
    out = run(f"""
        if {numpy_threads}:
            put({numpy_threads})
        before = get()
        import qdm
        qdm.covariance(np.cos(0.3 * np.arange(64)) + 0.1 * np.sin(0.01 * np.arange(64) ** 2),
                       order=4)
        print(before, get())
    """)
    before, after = out.split()
    assert after == before
    if numpy_threads:
        assert int(before) == numpy_threads


def shares_the_process_blas():
    """A library built on the shared BLAS (QDM_BLAS=reference) needs libblas.so.3,
    and in a process where numpy loaded first that soname is numpy's OpenBLAS."""
    import qdm._lib
    with open(qdm._lib.lib._name, "rb") as f:
        return b"libblas.so.3\x00" in f.read()


def test_results_do_not_depend_on_numpy_threads():
    if shares_the_process_blas():
        pytest.skip("the library runs on the process's shared BLAS")
    out = run("""
        import qdm
        t = np.arange(400)
        rng = np.random.default_rng(3)
        x = (np.exp((-0.003 + 2j * np.pi * 0.11) * t) + 0.7 * np.exp((-0.001 - 2j * np.pi * 0.3) * t)
             + 0.05 * (rng.standard_normal(400) + 1j * rng.standard_normal(400)))
        def fits():
            m = qdm.matrix_pencil(x, modes=4, pencil=130)
            c = qdm.covariance(x, order=12)
            p = qdm.pcar_psd(x.real, order=20, components=6, nfft=256)
            return [np.asarray(v).tobytes() for r in (m, c, p) for v in r]
        put(1)
        one = fits()
        put(2)
        two = fits()
        print(len(one), one == two, get())
    """)
    count, same, threads = out.split()
    assert int(count) > 0
    assert same == "True"
    assert threads == "2"
