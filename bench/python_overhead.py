"""Per-call overhead of the Python binding: the tiny fits of
bench/api_call_bench.c timed from Python, next to the same fits in C.

    python3 bench/python_overhead.py [path/to/api_call_bench]

(the package on PYTHONPATH or installed; the C program from the bench build,
cmake -DQDM_BUILD_BENCH=ON, target api_call_bench)."""
import subprocess
import sys
import timeit

import numpy as np

import qdm

t = np.arange(32)
x = np.cos(0.7 * t) * np.exp(-0.01 * t) + 0.01 * np.sin(3.1 * t * t)
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
print(f"{'fit (n=32, order 2)':22} {'Python us':>10} {'C us':>8} {'overhead us':>12}")
for name, f in fits.items():
    number = 20000 if name != "matrix_pencil" else 5000
    py = min(timeit.repeat(f, number=number, repeat=5)) / number * 1e6
    c = c_floor.get(name, float("nan"))
    print(f"{name:22} {py:10.2f} {c:8.2f} {py - c:12.2f}")
