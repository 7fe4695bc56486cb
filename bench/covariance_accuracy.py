#!/usr/bin/python3
"""Coefficient error of covariance AR on long, badly conditioned records.

    covariance_accuracy.py [--lengths N,N,...] [--orders P,P,...] [--seed S] [--json OUT]

Needs python3-numpy and the Python package qdm (python/; set QDM_LIBRARY to the
built libqdm_api.so). Records are ECG-like: a synthetic heartbeat train (P, QRS
and T waves as Gaussian bumps, beat-to-beat jitter, baseline wander, a little
white noise) at 360 samples/s, low-passed by a sharp FFT filter (a raised-cosine
edge from 0.08 to 0.10 of the sample rate, 100 dB down above it; --stopband) and, for complex records, made
analytic by an FFT Hilbert transform. The forward prediction system of such a
record is badly conditioned: about 2e8 at the default floor, about 2e7 at
1e-7.

Each fit's coefficients are compared with a reference solution of the same
least-squares problem: numpy's lstsq in double, then refined on the augmented
system [I A; A^H 0] [r; w] = [b; 0] (Björck), with the residuals of both block
rows computed in double-double arithmetic and the corrections solved through
the QR factors of A. The error of a solution w is max|w - w_ref| / max|w_ref|.
Rows print qdm's error, numpy lstsq's error, their ratio and the condition
number of A; `--check` also prints how far the reference moved in its last
step (its own accuracy).
"""
import argparse
import json
import os
import sys

import numpy as np

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "python"))
import qdm  # noqa: E402

RATE = 360.0


# ---- records -------------------------------------------------------------------------
def ecg_like(n, seed, complex_record=True, floor=1e-8):
    rng = np.random.default_rng(seed)
    t = np.arange(n) / RATE
    x = np.zeros(n)
    # (relative time in s, width in s, amplitude) of the P, Q, R, S and T waves
    waves = [(-0.20, 0.025, 0.15), (-0.03, 0.010, -0.12), (0.0, 0.011, 1.0),
             (0.03, 0.010, -0.25), (0.28, 0.045, 0.30)]
    beat = rng.uniform(0.0, 0.5)
    while beat < t[-1] + 1.0:
        scale = 1.0 + 0.05 * rng.standard_normal()
        for dt, width, amp in waves:
            c = beat + dt
            lo = max(0, int((c - 6 * width) * RATE))
            hi = min(n, int((c + 6 * width) * RATE) + 1)
            if lo < hi:
                seg = t[lo:hi] - c
                x[lo:hi] += scale * amp * np.exp(-0.5 * (seg / width) ** 2)
        beat += 0.83 * (1.0 + 0.04 * rng.standard_normal())
    x += 0.1 * np.sin(2 * np.pi * 0.3 * t + rng.uniform(0, 2 * np.pi))  # baseline wander
    x += 1e-3 * rng.standard_normal(n)
    # Sharp low-pass: pass below 0.08 fs, raised-cosine edge to 0.10 fs, nothing
    # above.
    spectrum = np.fft.fft(x)
    f = np.abs(np.fft.fftfreq(n))
    gain = np.clip((0.10 - f) / 0.02, 0.0, 1.0)
    gain = 0.5 - 0.5 * np.cos(np.pi * gain)
    spectrum *= gain
    if complex_record:
        # Analytic signal: negative frequencies removed, positive ones doubled.
        h = np.zeros(n)
        h[0] = 1.0
        if n % 2 == 0:
            h[n // 2] = 1.0
            h[1:n // 2] = 2.0
        else:
            h[1:(n + 1) // 2] = 2.0
        y = np.fft.ifft(spectrum * h)
        noise = rng.standard_normal(n) + 1j * rng.standard_normal(n)
    else:
        y = np.fft.ifft(spectrum).real
        noise = rng.standard_normal(n)
    # A white floor `floor` times the record's rms (a sensor's own noise) sets
    # the condition of the prediction system.
    noise *= floor * np.sqrt(np.mean(np.abs(y) ** 2) / np.mean(np.abs(noise) ** 2))
    return y + noise


def forward(x, p):
    A = np.lib.stride_tricks.sliding_window_view(x, p)[: len(x) - p, ::-1]
    return np.ascontiguousarray(A), x[p:].copy()


# ---- double-double arithmetic ------------------------------------------------------------
# A value is a pair (hi, lo) of float64 arrays with |lo| <= ulp(hi)/2; complex
# values are kept as separate real and imaginary pairs.
def two_sum(a, b):
    s = a + b
    bb = s - a
    return s, (a - (s - bb)) + (b - bb)


def split(a):
    c = 134217729.0 * a  # 2^27 + 1
    hi = c - (c - a)
    return hi, a - hi


def two_prod(a, b):
    p = a * b
    ah, al = split(a)
    bh, bl = split(b)
    return p, ((ah * bh - p) + ah * bl + al * bh) + al * bl


def dd_add(x, y):
    s, e = two_sum(x[0], y[0])
    e = e + x[1] + y[1]
    return two_sum(s, e)


def dd_neg(x):
    return -x[0], -x[1]


def dd_mul_d(x, d):
    """Double-double x times a double d."""
    p, e = two_prod(x[0], d)
    e = e + x[1] * d
    return two_sum(p, e)


def dd_sum(x, axis=0):
    """Sum along an axis by pairwise double-double additions."""
    hi, lo = np.moveaxis(x[0], axis, 0), np.moveaxis(x[1], axis, 0)
    while hi.shape[0] > 1:
        if hi.shape[0] % 2:
            pad = np.zeros((1,) + hi.shape[1:])
            hi, lo = np.concatenate([hi, pad]), np.concatenate([lo, pad])
        hi, lo = dd_add((hi[0::2], lo[0::2]), (hi[1::2], lo[1::2]))
    return hi[0], lo[0]


def dd(a):
    return np.asarray(a, float), np.zeros(np.shape(a))


def cdd_matvec(Ar, Ai, xr, xi, adjoint):
    """Complex A x (or A^H x) with A in doubles (Ar, Ai) and x in double-double
    (xr, xi pairs over the reduced index)."""
    if adjoint:
        # (Ar - i Ai)^T (xr + i xi): real = Ar^T xr + Ai^T xi, imag = Ar^T xi - Ai^T xr
        terms_r = [(Ar, xr, 1), (Ai, xi, 1)]
        terms_i = [(Ar, xi, 1), (Ai, xr, -1)]
        axis = 0
        expand = lambda v: (v[0][:, None], v[1][:, None])  # noqa: E731
    else:
        terms_r = [(Ar, xr, 1), (Ai, xi, -1)]
        terms_i = [(Ar, xi, 1), (Ai, xr, 1)]
        axis = 1
        expand = lambda v: (v[0][None, :], v[1][None, :])  # noqa: E731

    def part(terms):
        total = None
        for M, v, sign in terms:
            vh, vl = expand(v)
            prod = dd_mul_d((np.broadcast_to(vh, M.shape), np.broadcast_to(vl, M.shape)), M)
            if sign < 0:
                prod = dd_neg(prod)
            total = prod if total is None else dd_add(total, prod)
        return dd_sum(total, axis)

    return part(terms_r), part(terms_i)


def reference(A, b, steps=6):
    """The least-squares solution of A w = b, refined on the augmented system
    with double-double residuals. Returns (w, size of the last correction)."""
    complex_system = np.iscomplexobj(A)
    Ar, Ai = A.real.copy(), (A.imag.copy() if complex_system else np.zeros(A.shape))
    br, bi = b.real.copy(), (b.imag.copy() if complex_system else np.zeros(b.shape))
    Q, R = np.linalg.qr(A.astype(complex))
    w = np.linalg.lstsq(A.astype(complex), b.astype(complex), rcond=None)[0]
    wr, wi = dd(w.real), dd(w.imag)
    r = b - A @ w
    rr, ri = dd(r.real), dd(r.imag)
    last = np.inf
    for _ in range(steps):
        # f = b - r - A w, g = -A^H r, in double-double.
        awr, awi = cdd_matvec(Ar, Ai, wr, wi, adjoint=False)
        fr = dd_add(dd_add(dd(br), dd_neg(rr)), dd_neg(awr))
        fi = dd_add(dd_add(dd(bi), dd_neg(ri)), dd_neg(awi))
        gr, gi = cdd_matvec(Ar, Ai, rr, ri, adjoint=True)
        f = fr[0] + 1j * fi[0]
        g = -(gr[0] + 1j * gi[0])
        # [I A; A^H 0] [dr; dw] = [f; g] through A = QR.
        u = np.linalg.solve(R.conj().T, g)
        qf = Q.conj().T @ f
        dw = np.linalg.solve(R, qf - u)
        dr = Q @ (u - qf) + f
        wr = dd_add(wr, dd(dw.real))
        wi = dd_add(wi, dd(dw.imag))
        rr = dd_add(rr, dd(dr.real))
        ri = dd_add(ri, dd(dr.imag))
        last = np.max(np.abs(dw))
    w = wr[0] + 1j * wi[0]
    if not complex_system:
        w = w.real
    return w, last / np.max(np.abs(w))


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--lengths", default="4000,16000,108000")
    ap.add_argument("--orders", default="9,20")
    ap.add_argument("--seed", type=int, default=1)
    ap.add_argument("--floor", type=float, default=1e-8, help="white floor / record rms")
    ap.add_argument("--real", action="store_true", help="real records instead of analytic ones")
    ap.add_argument("--check", action="store_true")
    ap.add_argument("--json")
    args = ap.parse_args()
    rows = []
    print(f"| {'real' if args.real else 'complex'} record | n | p | cond(A) | qdm error | "
          f"numpy lstsq error | qdm/numpy |" + (" reference step |" if args.check else ""))
    print("|---|---:|---:|---:|---:|---:|---:|" + ("---:|" if args.check else ""))
    for n in [int(v) for v in args.lengths.split(",")]:
        for p in [int(v) for v in args.orders.split(",")]:
            x = ecg_like(n, args.seed, complex_record=not args.real, floor=args.floor)
            A, b = forward(x, p)
            w_ref, step = reference(A, b)
            w_np = np.linalg.lstsq(A, b, rcond=None)[0]
            w_qdm = -qdm.covariance(x, order=p).coefficients[1:]
            scale = np.max(np.abs(w_ref))
            e_qdm = np.max(np.abs(w_qdm - w_ref)) / scale
            e_np = np.max(np.abs(w_np - w_ref)) / scale
            cond = np.linalg.cond(A)
            row = dict(n=n, p=p, cond=cond, qdm=e_qdm, numpy=e_np, step=step)
            rows.append(row)
            print(f"| ECG-like | {n} | {p} | {cond:.2g} | {e_qdm:.2g} | {e_np:.2g} | "
                  f"{e_qdm / e_np:.2g} |" + (f" {step:.1g} |" if args.check else ""), flush=True)
    if args.json:
        with open(args.json, "w") as fh:
            json.dump(rows, fh, indent=1)


if __name__ == "__main__":
    main()
