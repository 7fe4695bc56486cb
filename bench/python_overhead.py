"""Per-call overhead of the Python binding: the tiny fits of
bench/api_call_bench.c timed from Python, next to the same fits in C and the
bare ctypes calls. CPU time, as the C program measures it, so other work on
the machine does not enter the figures.

    python3 bench/python_overhead.py [path/to/api_call_bench]

(the package on PYTHONPATH or installed; the C program from the bench build,
cmake -DQDM_BUILD_BENCH=ON, target api_call_bench)."""
import subprocess
import sys
import time
import timeit

import numpy as np

import qdm

t = np.arange(32)
x = np.cos(0.7 * t) * np.exp(-0.01 * t) + 0.01 * np.sin(3.1 * t * t)
# The same calls through ctypes alone, outputs allocated once beforehand: the
# cost of the foreign call itself, without the package's checks and results.
from qdm._lib import functions as fn  # noqa: E402
import ctypes  # noqa: E402

out = np.zeros(16)
o, xp = out.ctypes.data, x.ctypes.data
cnt, v1, v2 = ctypes.c_int32(), ctypes.c_double(), ctypes.c_double()
bare = {
    "covariance": lambda: fn["covariance", "real"](xp, 32, 2, o, o + 32, ctypes.byref(v1)),
    "prony": lambda: fn["prony", "real"](xp, 32, 2, 1.0, 0, o, o + 16, o + 32, o + 48,
                                         ctypes.byref(cnt)),
    "matrix_pencil": lambda: fn["matrix_pencil", "real"](xp, 32, 10, 2, 1.0, 0, o, o + 16, o + 32,
                                                         o + 48, ctypes.byref(cnt),
                                                         ctypes.byref(v2)),
}
fits = {
    "covariance": lambda: qdm.covariance(x, order=2),
    "prony": lambda: qdm.prony(x, order=2),
    "matrix_pencil": lambda: qdm.matrix_pencil(x, modes=2, pencil=10),
}
c_floor = {}
if len(sys.argv) > 1:
    for line in subprocess.run([sys.argv[1]], capture_output=True, text=True,
                               check=True).stdout.split("\n"):
        if line:
            name, us = line.split()
            c_floor[name] = float(us)
print(f"{'fit (n=32, order 2)':20} {'C':>8} {'ctypes':>8} {'qdm':>8} {'qdm - C':>8}  (us per call)")
for name, f in fits.items():
    number = 20000 if name != "matrix_pencil" else 5000
    py, raw = (min(timeit.repeat(g, number=number, repeat=7, timer=time.process_time))
               / number * 1e6 for g in (f, bare[name]))
    c = c_floor.get(name, float("nan"))
    print(f"{name:20} {c:8.2f} {raw:8.2f} {py:8.2f} {py - c:8.2f}")
