#!/usr/bin/python3
"""Estimators next to numpy, on the same records and the same BLAS, in one run.

    estimators_bench.py run BENCH LIBQDM [--quick] [--rounds R] [--json OUT]
    estimators_bench.py compare OLD.json NEW.json

`run` starts the C++ benchmark BENCH (bench/estimators_bench) on the library
LIBQDM, which calls every export through the host ABI and writes its records
and outputs as JSON. Then, R rounds over (default 3), each case is timed twice
back to back: by BENCH alone on that case (`--only`), then as the cheapest
numpy equivalent of its output on the same record. Both times are ms of
process CPU time, the best of several batches. One row per case gives the
median of each time over the rounds, the median ratio numpy / qdm of the
rounds (above 1 means qdm is faster) with the lowest and highest beside it,
and a check column, the largest relative difference between the two outputs
(coefficients, poles, mode frequencies and amplitudes; spectra in dB). Timing
each pair back to back, and taking medians, keeps the drift of a shared
machine out of the ratio. Run both under the same LD_LIBRARY_PATH so that
numpy and libqdm load the same BLAS.

`compare` prints, per case and output, the largest relative difference
between two JSON documents written by `run --json` (or by BENCH itself): how
far a change to the library moved its answers.
"""
import json
import subprocess
import sys
import time

import numpy as np

EPS = np.finfo(float).eps


def best_time(fn, quick):
    fn()
    batch, batches = (0.005, 2) if quick else (0.05, 5)
    reps = 1
    while True:
        t0 = time.process_time()
        for _ in range(reps):
            fn()
        t = time.process_time() - t0
        if t >= batch or reps >= 1 << 20:
            break
        reps = reps * 10 if t <= 0 else max(reps + 1, int(reps * batch / t))
    best = float("inf")
    for _ in range(batches):
        t0 = time.process_time()
        for _ in range(reps):
            fn()
        best = min(best, (time.process_time() - t0) / reps)
    return best


# ---- numpy equivalents -------------------------------------------------------------------
def forward(x, p):
    """Rows i: x[i+p-1-j], right-hand side x[i+p]."""
    A = np.lib.stride_tricks.sliding_window_view(x, p)[: len(x) - p, ::-1]
    return A, x[p:]


def covariance(x, p):
    A, b = forward(x, p)
    w = np.linalg.lstsq(A, b, rcond=None)[0]
    a = np.concatenate(([1.0], -w))
    r = A @ w - b
    return a, np.roots(a), np.vdot(r, r).real / len(b)


def pcar(x, p, k):
    A, b = forward(x, p)
    B = np.lib.stride_tricks.sliding_window_view(x, p)[1 : len(x) - p + 1]
    A = np.vstack((A, B.conj()))
    b = np.concatenate((b, x[: len(x) - p].conj()))
    U, s, Vh = np.linalg.svd(A, full_matrices=False)
    w = Vh[:k].conj().T @ ((U[:, :k].conj().T @ b) / s[:k])
    a = np.concatenate(([1.0], -w))
    return a, np.roots(a)


def amplitudes(x, z):
    V = np.vander(z, len(x), increasing=True).T
    return np.linalg.lstsq(V, x.astype(complex), rcond=None)[0]


def modes(A, z, real_flag):
    ang = np.angle(z)
    keep = (ang >= 0) & (ang < np.pi) if real_flag else np.ones(len(z), bool)
    return np.abs(A[keep]), ang[keep] / (2 * np.pi)


def prony(x, p, real_flag):
    _, z, _ = covariance(x, p)
    return modes(amplitudes(x, z), z, real_flag)


def pencil(x, L, M, real_flag):
    q = len(x) - L
    W = np.lib.stride_tricks.sliding_window_view(x, L + 1)[:q]
    Y1, Y2 = W[:, L - 1 :: -1][:, :L], W[:, L:0:-1]
    U, s, Vh = np.linalg.svd(Y1, full_matrices=False)
    K = (U[:, :M].conj().T @ Y2 @ Vh[:M].conj().T) / s[:M, None]
    z = np.linalg.eigvals(K)
    return modes(amplitudes(x, z), z, real_flag)


def spectrum_db(a, points):
    L = 1 << int(np.ceil(np.log2(points)))
    P = 1.0 / np.abs(np.fft.fft(a, L)) ** 2
    return np.fft.fftshift(10 * np.log10(P / P.max()))


def cov_spectrum(x, p, points):
    a, _, v = covariance(x, p)
    return spectrum_db(a, points), v


def pcar_spectrum(x, p, k, points, real_flag):
    a, z = pcar(x, p, k)
    sel = z[np.argsort(np.abs(np.abs(z) - 1), kind="stable")[:k]]
    amp, f = modes(amplitudes(x, sel), sel, real_flag)
    return spectrum_db(a, points), amp, f


# ---- agreement ---------------------------------------------------------------------------
def rel(u, v):
    u, v = np.asarray(u), np.asarray(v)
    if u.shape != v.shape:
        return float("inf")
    scale = max(np.max(np.abs(v), initial=0.0), np.finfo(float).tiny)
    return float(np.max(np.abs(u - v), initial=0.0) / scale)


def rel_set(u, v):
    """Relative difference of two sets of complex values, matched greedily."""
    u, v = list(np.asarray(u, complex)), list(np.asarray(v, complex))
    if len(u) != len(v):
        return float("inf")
    scale = max(max((abs(c) for c in v), default=0.0), np.finfo(float).tiny)
    worst = 0.0
    for c in u:
        j = min(range(len(v)), key=lambda i: abs(v[i] - c))
        worst = max(worst, abs(v[j] - c))
        v.pop(j)
    return worst / scale


def cx(flat):
    f = np.asarray(flat, float)
    return f[0::2] + 1j * f[1::2]


def mode_set(amp, freq, real_flag):
    """Modes as complex points (frequency, amplitude). For real records a pole
    within rounding of the real axis is reported or dropped by the sign of a
    rounding-sized imaginary part, so such poles are left out of the check."""
    f, a = np.asarray(freq, float), np.asarray(amp, float)
    if real_flag:
        keep = (np.abs(f) > 1e-9) & (np.abs(f - 0.5) > 1e-9)
        f, a = f[keep], a[keep]
    return f + 1j * a


def equivalent(case, x):
    """(numpy callable, check callable(out) -> largest relative difference), or None."""
    name, prm, out = case["name"], case["params"], case["outputs"]
    cplx = name.startswith("QdmCx")
    flag = not cplx
    p = int(prm.get("p", 0))
    if name.endswith("CovarianceH"):
        def check():
            a, z, v = covariance(x, p)
            got_a = cx(out["coefficients"]) if cplx else np.asarray(out["coefficients"])
            return max(rel(got_a, a), rel_set(cx(out["poles"]), z), rel([out["variance"][0]], [v]))
        return (lambda: covariance(x, p)), check
    if name.endswith("PCARH"):
        k = int(prm["k"])
        def check():
            a, z = pcar(x, p, k)
            got_a = cx(out["coefficients"]) if cplx else np.asarray(out["coefficients"])
            return max(rel(got_a, a), rel_set(cx(out["poles"]), z))
        return (lambda: pcar(x, p, k)), check
    if name.endswith("PronyH"):
        def check():
            amp, f = prony(x, p, flag)
            return rel_set(mode_set(out["amplitude"], out["frequency"], flag), mode_set(amp, f, flag))
        return (lambda: prony(x, p, flag)), check
    if name.endswith("MatrixPencilH"):
        L, M = int(prm["L"]), int(prm["M"])
        def check():
            amp, f = pencil(x, L, M, flag)
            return rel_set(mode_set(out["amplitude"], out["frequency"], flag), mode_set(amp, f, flag))
        return (lambda: pencil(x, L, M, flag)), check
    if name.endswith("CovPowerSpectrH"):
        m = int(prm["m"])
        def check():
            s, v = cov_spectrum(x, p, m)
            got = np.asarray(out["spectrum"])
            return max(float(np.max(np.abs(got - s))) / max(1.0, float(np.max(np.abs(s)))),
                       rel([out["variance"][0]], [v]))
        return (lambda: cov_spectrum(x, p, m)), check
    if name.endswith("PCARPowerSpectrumH"):
        m, k = int(prm["m"]), int(prm["k"])
        def check():
            s, amp, f = pcar_spectrum(x, p, k, m, flag)
            got = np.asarray(out["spectrum"])
            return max(float(np.max(np.abs(got - s))) / max(1.0, float(np.max(np.abs(s)))),
                       rel_set(mode_set(out["amplitude"], out["frequency"], flag), mode_set(amp, f, flag)))
        return (lambda: pcar_spectrum(x, p, k, m, flag)), check
    return None


def qdm_seconds(bench, lib, case, quick):
    cmd = [bench, lib, "--only", f"{case['name']}:{case['record']}"] + (["--quick"] if quick else [])
    doc = json.loads(subprocess.run(cmd, check=True, capture_output=True, text=True).stdout)
    return doc["cases"][0]["seconds"]


def run(bench, lib, quick, rounds, json_out):
    doc = json.loads(subprocess.run([bench, lib, "--untimed"], check=True, capture_output=True,
                                    text=True).stdout)
    records = {}
    for key, flat in doc["records"].items():
        records[key] = cx(flat) if key.startswith("complex") else np.asarray(flat, float)
    print(f"libqdm BLAS: {doc['blas']}")
    print(f"numpy {np.__version__}, BLAS: {numpy_blas()}")
    print(f"{rounds} rounds, each case timed back to back with its numpy equivalent")
    print()
    print("| export | n | qdm ms | numpy ms | numpy/qdm | lowest–highest | check | numpy lstsq alone ms |")
    print("|---|---:|---:|---:|---:|---:|---:|---:|")
    for case in doc["cases"]:
        x = records[case["record"]]
        n = len(x)
        eq = equivalent(case, x)
        qdm = []
        peer = []
        alone = []
        for _ in range(rounds):
            qdm.append(qdm_seconds(bench, lib, case, quick))
            if eq is None or case["status"] != 0:
                continue
            peer.append(best_time(eq[0], quick))
            if case["name"].endswith("CovarianceH"):
                A, b = forward(x, int(case["params"]["p"]))
                alone.append(best_time(lambda: np.linalg.lstsq(A, b, rcond=None), quick))
        case["seconds"] = float(np.median(qdm))
        qdm_ms = 1e3 * case["seconds"]
        if case["status"] != 0:
            print(f"| {case['name']} | {n} | {qdm_ms:.3f} | | | | status {case['status']} | |")
            continue
        if eq is None:
            print(f"| {case['name']} | {n} | {qdm_ms:.3f} | - | - | | - | |")
            continue
        ratios = [p / q for p, q in zip(peer, qdm)]
        alone_ms = f"{1e3 * np.median(alone):.3f}" if alone else ""
        print(f"| {case['name']} | {n} | {qdm_ms:.3f} | {1e3 * np.median(peer):.3f} "
              f"| {np.median(ratios):.2f} | {min(ratios):.2f}–{max(ratios):.2f} "
              f"| {eq[1]():.1e} | {alone_ms} |", flush=True)
    if json_out:
        with open(json_out, "w") as f:
            json.dump(doc, f)


def numpy_blas():
    """The BLAS/LAPACK file numpy's extension actually loaded, from /proc/self/maps."""
    np.linalg.svd(np.eye(2))
    libs = set()
    with open("/proc/self/maps") as f:
        for line in f:
            path = line.split()[-1]
            if any(s in path for s in ("blas", "lapack")) and path.endswith(tuple("0123456789o")):
                libs.add(path)
    return ", ".join(sorted(libs)) or "unknown"


def compare(old_path, new_path):
    with open(old_path) as f:
        old = json.load(f)
    with open(new_path) as f:
        new = json.load(f)
    index = {(c["name"], c["record"]): c for c in old["cases"]}
    print("| export | record | status old/new | output: largest relative difference |")
    print("|---|---|---|---|")
    for c in new["cases"]:
        o = index.get((c["name"], c["record"]))
        if o is None:
            continue
        parts = []
        for key, v in c["outputs"].items():
            u = o["outputs"].get(key)
            if u is None:
                continue
            if key in ("poles",):
                d = rel_set(cx(v), cx(u))
            elif key in ("amplitude", "phase", "damping", "frequency") or len(v) != len(u):
                d = rel(sorted(v), sorted(u)) if len(v) == len(u) else float("inf")
            else:
                d = rel(v, u)
            parts.append(f"{key} {d:.1e}")
        print(f"| {c['name']} | {c['record']} | {o['status']}/{c['status']} | {', '.join(parts)} |")


if __name__ == "__main__":
    if len(sys.argv) >= 4 and sys.argv[1] == "run":
        out = sys.argv[sys.argv.index("--json") + 1] if "--json" in sys.argv else None
        rounds = int(sys.argv[sys.argv.index("--rounds") + 1]) if "--rounds" in sys.argv else 3
        run(sys.argv[2], sys.argv[3], "--quick" in sys.argv, rounds, out)
    elif len(sys.argv) == 4 and sys.argv[1] == "compare":
        compare(sys.argv[2], sys.argv[3])
    else:
        print(__doc__)
        sys.exit(2)
