#!/usr/bin/env python3
"""The pencil's Krylov route against its dense route, wherever both run: L = n/3,
M = 2..16 modes, real and complex records at 10-40 dB, noise-free records, and
two modes 1/n apart in frequency. For every mode whose singular value stands
clear of the noise (s_M / s_(M+1) >= 2, from a dense SVD of the data matrix)
it compares frequency and damping (relative), amplitude (relative) and phase
(absolute), and the statuses of the two routes.

    QDM_LIBRARY=build/release/libqdm_api.so.1 PYTHONPATH=python \\
        python3 bench/pencil_agreement.py [--max-n 8192]

Prints one row per case and, last, the largest differences met and how many
cases held the bounds (frequency, damping 1e-9; amplitude, phase 1e-8).
Exits 1 when a case broke them. The dense route at n = 8192 takes about half a
minute per complex case, so the full table takes a while.
"""
import argparse
import sys
import warnings

import numpy as np

import qdm


def record(n, m, snr_db, complex_, close, seed):
    rng = np.random.default_rng(seed)
    t = np.arange(n)
    if close:  # two modes 1/n apart
        f = np.array([0.2, 0.2 + 1.0 / n])
        d = np.array([-1.0, -1.5]) / n
    else:
        f = np.sort(rng.uniform(-0.45 if complex_ else 0.02, 0.45, m))
        d = -rng.uniform(0.5, 4.0, m) / n
    a = rng.uniform(0.5, 2.0, len(f)) * np.exp(2j * np.pi * rng.uniform(0, 1, len(f)))
    x = (a * np.exp(np.outer(t, d + 2j * np.pi * f))).sum(axis=1)
    if not complex_:
        x = x.real
    if snr_db is not None:
        sigma = np.sqrt(np.mean(np.abs(x) ** 2)) * 10 ** (-snr_db / 20)
        if complex_:
            x = x + sigma / np.sqrt(2) * (rng.standard_normal(n) + 1j * rng.standard_normal(n))
        else:
            x = x + sigma * rng.standard_normal(n)
    return x


def singular_gap(x, L, M):
    """s_M / s_(M+1) of the (n - L)-by-L data matrix."""
    n = len(x)
    H = np.lib.stride_tricks.sliding_window_view(x, L)[: n - L, ::-1]
    s = np.linalg.svd(H, compute_uv=False)
    return s[M - 1] / s[M] if M < len(s) and s[M] > 0 else np.inf


def fit(x, M, solver):
    with warnings.catch_warnings(record=True) as w:
        warnings.simplefilter("always")
        try:
            r = qdm.matrix_pencil(x, modes=M, solver=solver)
        except qdm.Error as e:
            return e.code, None
    return (20001 if w else 0), r


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--max-n", type=int, default=8192)
    a = ap.parse_args()
    cases = []
    for n in (n for n in (512, 2048, 8192) if n <= a.max_n):
        for complex_ in (True, False):
            for M in (2, 4, 8, 16):
                for snr in (10, 20, 40, None):
                    cases.append((n, M, snr, complex_, False))
            cases.append((n, 2, 40, complex_, True))
            cases.append((n, 2, None, complex_, True))
    worst = dict(frequency=0.0, damping=0.0, amplitude=0.0, phase=0.0)
    bounds = dict(frequency=1e-9, damping=1e-9, amplitude=1e-8, phase=1e-8)
    held = 0
    print(f"{'n':>5} {'M':>3} {'snr':>4} {'kind':>8} {'gap':>9} {'clear':>5} {'status':>11} "
          f"{'freq':>8} {'damp':>8} {'amp':>8} {'phase':>8}")
    for i, (n, M, snr, complex_, close) in enumerate(cases):
        x = record(n, M, snr, complex_, close, seed=i)
        # real records at M modes: M conjugate pairs would need 2M; fit 2M poles
        Mfit = M if complex_ or close else min(2 * M, n // 3)
        if not complex_ and close:
            Mfit = 4
        gap = singular_gap(x, n // 3, Mfit)
        (sd, d), (sk, k) = fit(x, Mfit, "dense"), fit(x, Mfit, "krylov")
        diffs = dict(frequency=0.0, damping=0.0, amplitude=0.0, phase=0.0)
        if d is not None and k is not None and gap >= 2 and len(d.frequency) == len(k.frequency):
            od, ok = np.argsort(d.frequency), np.argsort(k.frequency)
            rel = lambda u, v: np.max(np.abs(u - v) / np.maximum(np.abs(u), 1e-3))
            diffs["frequency"] = rel(d.frequency[od], k.frequency[ok])
            diffs["damping"] = rel(d.damping[od], k.damping[ok])
            diffs["amplitude"] = rel(d.amplitude[od], k.amplitude[ok])
            dp = np.angle(np.exp(1j * (d.phase[od] - k.phase[ok])))
            diffs["phase"] = np.max(np.abs(dp))
        ok_case = sd == sk and all(diffs[q] <= bounds[q] for q in bounds)
        held += ok_case
        for q in worst:
            worst[q] = max(worst[q], diffs[q])
        kind = ("cx" if complex_ else "re") + ("-close" if close else "")
        print(f"{n:>5} {Mfit:>3} {snr if snr else 'inf':>4} {kind:>8} {gap:>9.3g} "
              f"{'yes' if gap >= 2 else 'no':>5} {sd:>5}/{sk:<5} "
              + " ".join(f"{diffs[q]:>8.1e}" for q in ("frequency", "damping", "amplitude",
                                                         "phase"))
              + ("" if ok_case else "  <-- outside"), flush=True)
    print("largest differences: " + ", ".join(f"{q} {worst[q]:.1e}" for q in worst))
    print(f"{held} of {len(cases)} cases within the bounds with equal statuses")
    return 0 if held == len(cases) else 1


if __name__ == "__main__":
    sys.exit(main())
