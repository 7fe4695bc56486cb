#!/usr/bin/env python3
"""Long records at the textbook pencil (L = n/3): qdm's Krylov route, its dense
route and the route a scipy user would write (svds/ARPACK on a LinearOperator
whose products are numpy FFT convolutions, then the pencil steps in numpy), side
by side in one run, each case in a fresh process so that its peak memory is its
own.

    QDM_LIBRARY=build/release/libqdm_api.so.1 PYTHONPATH=python \\
        python3 bench/pencil_long.py [--max-n 1048576] [--dense-max-n 8192]

Complex records of M = 8 damped modes at 30 dB SNR, one thread (OpenBLAS's and
numpy's). Prints one row per n: seconds (the best of three calls in one process
up to n = 2^18, one call above) and peak RSS per route, and the largest
frequency difference between qdm and scipy over the modes.
"""
import argparse
import json
import os
import subprocess
import sys
import time

M = 8


def record(n):
    import numpy as np
    t = np.arange(n)
    f = 0.05 + 0.11 * np.arange(M)
    x = np.zeros(n, complex)
    for fi in f:  # one mode at a time: no n-by-M temporaries in the peak memory
        x += np.exp(t * (-2.0 / n + 2j * np.pi * fi))
    rng = np.random.default_rng(1)
    x += 10 ** (-30 / 20) / np.sqrt(2) * rng.standard_normal(n)
    x += 1j * 10 ** (-30 / 20) / np.sqrt(2) * rng.standard_normal(n)
    return x


def scipy_pencil(x, L, m):
    """The matrix pencil a scipy user would write for a long record."""
    import numpy as np
    from scipy.fft import next_fast_len
    from scipy.sparse.linalg import LinearOperator, svds
    n = len(x)
    q = n - L
    N = next_fast_len(n)
    X = np.fft.fft(x, N)

    def product(v, rows):  # (H v) for the rows-by-L Hankel H[i][j] = x[i + L - 1 - j]
        return np.fft.ifft(X * np.fft.fft(v.ravel(), N))[L - 1:L - 1 + rows]

    def adjoint(u):  # H^H u: the correlation of conj(x) with u
        return (np.fft.fft(np.fft.fft(u.ravel(), N) * np.conj(X)) / N)[L - 1::-1]

    H = LinearOperator((q, L), matvec=lambda v: product(v, q), rmatvec=adjoint, dtype=complex)
    _, s, vh = svds(H, k=m, random_state=0)
    order = np.argsort(s)[::-1]
    s, V = s[order], vh[order].conj().T
    Z = np.stack([product(V[:, i], q + 1) for i in range(m)], axis=1)
    K = (Z[:q].conj().T @ Z[1:]) / (s[:, None] ** 2)
    z = np.linalg.eigvals(K)
    A = np.linalg.lstsq(np.vander(z, n, increasing=True).T, x, rcond=None)[0]
    return np.angle(z) / (2 * np.pi), np.abs(A)


def one(route, n):
    """Runs one case in this process; prints seconds and the sorted frequencies."""
    import numpy as np
    x = record(n)
    L = n // 3
    seconds = []
    for _ in range(3 if n <= 1 << 18 and route != "dense" else 1):  # best of three, warm
        t0 = time.perf_counter()
        if route == "scipy":
            f, _ = scipy_pencil(x, L, M)
        else:
            import qdm
            f = qdm.matrix_pencil(x, modes=M, pencil=L, solver=route).frequency
        seconds.append(time.perf_counter() - t0)
    print(json.dumps({"seconds": min(seconds), "frequency": sorted(np.asarray(f).tolist())}))


def run(route, n):
    env = dict(os.environ, OPENBLAS_NUM_THREADS="1", OMP_NUM_THREADS="1")
    p = subprocess.Popen([sys.executable, __file__, "--one", route, str(n)],
                         stdout=subprocess.PIPE, env=env)
    out = p.stdout.read()
    _, rc, usage = os.wait4(p.pid, 0)
    if rc != 0:
        return None
    result = json.loads(out)
    result["rss_mb"] = usage.ru_maxrss / 1024
    return result


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--max-n", type=int, default=1 << 20)
    ap.add_argument("--dense-max-n", type=int, default=8192)
    ap.add_argument("--one", nargs=2)
    a = ap.parse_args()
    if a.one:
        one(a.one[0], int(a.one[1]))
        return
    print(f"{'n':>9} {'krylov s':>9} {'MB':>6} {'dense s':>9} {'scipy s':>9} {'MB':>6} "
          f"{'scipy/krylov':>12} {'max |df|':>9}")
    for n in (n for n in (4096, 8192, 16384, 65536, 262144, 1 << 20) if n <= a.max_n):
        k = run("krylov", n)
        d = run("dense", n) if n <= a.dense_max_n else None
        s = run("scipy", n)
        df = max(abs(u - v) for u, v in zip(k["frequency"], s["frequency"])) if k and s else None
        print(f"{n:>9} {k['seconds']:>9.3f} {k['rss_mb']:>6.0f} "
              f"{d['seconds'] if d else float('nan'):>9.3f} {s['seconds']:>9.3f} "
              f"{s['rss_mb']:>6.0f} {s['seconds'] / k['seconds']:>12.1f} {df:>9.1e}", flush=True)


if __name__ == "__main__":
    main()
