"""Eight Python threads fitting at once against one thread doing the same work
in sequence: the binding releases the GIL for every fit, so the threads run on
every core. Each thread's results are checked against the single-thread ones.

    python3 bench/python_threads.py [fits per thread]

Run with a single-threaded BLAS: Debian's default libblas is OpenBLAS's pthread
build, whose own thread pool, called from eight threads at once on a small
machine, slows every fit tenfold and more. The script sets
OPENBLAS_NUM_THREADS=1 unless the caller chose a value."""
import os
import sys
import threading
import time

os.environ.setdefault("OPENBLAS_NUM_THREADS", "1")  # before numpy loads OpenBLAS
import numpy as np  # noqa: E402

import qdm  # noqa: E402

THREADS = 8
per_thread = int(sys.argv[1]) if len(sys.argv) > 1 else 40
rng = np.random.default_rng(1)
t = np.arange(512)
signals = [np.exp((-0.002 + 2j * np.pi * 0.1) * t) + 0.5 * np.exp((-0.004 + 2j * np.pi * 0.23) * t)
           + 0.1 * (rng.standard_normal(512) + 1j * rng.standard_normal(512))
           for _ in range(THREADS)]


def work(x):
    return [qdm.matrix_pencil(x, modes=8, pencil=170) for _ in range(per_thread)]


t0 = time.perf_counter()
sequential = [work(x) for x in signals]
t_seq = time.perf_counter() - t0

threaded = [None] * THREADS


def run(i):
    threaded[i] = work(signals[i])


threads = [threading.Thread(target=run, args=(i,)) for i in range(THREADS)]
t0 = time.perf_counter()
for th in threads:
    th.start()
for th in threads:
    th.join()
t_thr = time.perf_counter() - t0

same = all(np.array_equal(a.frequency, b.frequency) and np.array_equal(a.amplitude, b.amplitude)
           and a.mse == b.mse for s, p in zip(sequential, threaded) for a, b in zip(s, p))
fits = THREADS * per_thread
print(f"{fits} matrix-pencil fits (n=512, L=170, 8 modes, complex) on {os.cpu_count()} cores, "
      f"OPENBLAS_NUM_THREADS={os.environ['OPENBLAS_NUM_THREADS']}")
print(f"  one thread in sequence: {t_seq:.3f} s ({t_seq / fits * 1e3:.2f} ms/fit)")
print(f"  {THREADS} threads at once:     {t_thr:.3f} s ({t_thr / fits * 1e3:.2f} ms/fit)")
print(f"  speed-up {t_seq / t_thr:.2f}x; every thread got the single-thread results: {same}")
sys.exit(0 if same else 1)
