"""qdm and numpy in one process, each with its own BLAS threads.

    python3 bench/blas_sharing.py [fits per thread]

1. numpy's 2000x2000 svd and matmul, timed before and after `import qdm`:
   importing the library must not change numpy's OpenBLAS (its thread count is
   printed as well).
2. Sixteen Python threads each fitting matrix pencils through the binding
   (which releases the GIL), with numpy's OpenBLAS set to 1, 2 and its default
   number of threads: the library's own BLAS runs on one thread whatever numpy's
   is set to, so neither the time nor the results may change (the fits are
   compared bit for bit with those made right after the import).

Times are the best of a few runs, in seconds. QDM_LIBRARY picks the library
(as for the package), e.g. a build of another revision to compare."""
import ctypes
import re
import sys
import threading
import time

import numpy as np

REPEATS = 3
THREADS = 16
per_thread = int(sys.argv[1]) if len(sys.argv) > 1 else 20


def numpy_openblas():
    maps = open("/proc/self/maps").read()
    paths = sorted(set(re.findall(r"/\S*libopenblas\S*\.so\S*", maps)))
    if len(paths) != 1:
        sys.exit(f"numpy does not run on one OpenBLAS here: {paths}")
    return ctypes.CDLL(paths[0])


def best(f):
    times = []
    for _ in range(REPEATS):
        t0 = time.perf_counter()
        f()
        times.append(time.perf_counter() - t0)
    return min(times)


blas = numpy_openblas()
default_threads = blas.openblas_get_num_threads()
rng = np.random.default_rng(0)
a = rng.standard_normal((2000, 2000))
b = rng.standard_normal((2000, 2000))


def numpy_row(label):
    svd = best(lambda: np.linalg.svd(a))
    mm = best(lambda: a @ b)
    print(f"{label:<22} {blas.openblas_get_num_threads():>8} {svd:>9.3f} {mm:>9.3f}")


print(f"numpy 2000x2000        {'threads':>8} {'svd':>9} {'matmul':>9}")
numpy_row("before import qdm")
import qdm  # noqa: E402

numpy_row("after import qdm")

t = np.arange(512)
signals = [np.exp((-0.002 + 2j * np.pi * 0.1) * t) + 0.5 * np.exp((-0.004 + 2j * np.pi * 0.23) * t)
           + 0.1 * (rng.standard_normal(512) + 1j * rng.standard_normal(512))
           for _ in range(THREADS)]
reference = [qdm.matrix_pencil(x, modes=8, pencil=170) for x in signals]


differs = []


def workload():
    results = [None] * THREADS

    def work(i):
        for _ in range(per_thread):
            results[i] = qdm.matrix_pencil(signals[i], modes=8, pencil=170)

    threads = [threading.Thread(target=work, args=(i,)) for i in range(THREADS)]
    for th in threads:
        th.start()
    for th in threads:
        th.join()
    differs.append(any(not np.array_equal(u, v)
                       for got, want in zip(results, reference) for u, v in zip(got, want)))


print()
print(f"{THREADS} threads x {per_thread} matrix_pencil fits (n = 512, pencil 170, 8 modes)")
print(f"{'numpy threads':<22} {'seconds':>9}  results")
for n in sorted({1, 2, default_threads}):
    blas.openblas_set_num_threads(n)
    label = f"{n}" + (" (default)" if n == default_threads else "")
    differs.clear()
    seconds = best(workload)
    print(f"{label:<22} {seconds:>9.3f}  "
          + ("differ from the fits made at import" if any(differs) else "bit-identical"))
blas.openblas_set_num_threads(default_threads)
