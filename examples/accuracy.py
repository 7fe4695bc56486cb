"""Accuracy of the matrix pencil and Prony's method against the Cramer-Rao bound.

Monte Carlo over SNRs from 0 to 40 dB: two damped complex exponentials in
complex white Gaussian noise, n = 64 samples. The bound is computed here, in
numpy only, from the Fisher information of the model
    s[t] = sum_i a_i exp(j phi_i) exp((alpha_i + j 2 pi f_i) t).
Plots the frequency and damping MSE of the first mode against the bound and
prints the MSE/CRB ratios.

    python3 examples/accuracy.py [out.png] [trials]   (default docs/images/accuracy.png, 500)"""
import sys
import warnings

import matplotlib

matplotlib.use("Agg")
import matplotlib.pyplot as plt  # noqa: E402
import numpy as np  # noqa: E402

import qdm  # noqa: E402

N = 64
AMP = np.array([1.0, 0.8])
PHASE = np.array([0.3, -1.1])
DAMP = np.array([-0.01, -0.02])     # per sample
FREQ = np.array([0.20, 0.28])       # cycles per sample
SNRS = np.arange(0, 41, 5)          # dB, of the first mode: a_1^2 / noise variance
out = sys.argv[1] if len(sys.argv) > 1 else "docs/images/accuracy.png"
trials = int(sys.argv[2]) if len(sys.argv) > 2 else 500
t = np.arange(N)
modes = AMP[:, None] * np.exp(1j * PHASE[:, None]) * np.exp((DAMP + 2j * np.pi * FREQ)[:, None] * t)
clean = modes.sum(axis=0)


def crb(noise_var):
    """Diagonal of the inverse Fisher information, parameters per mode in the
    order amplitude, phase, damping, frequency."""
    cols = []
    for i in range(len(AMP)):
        s = modes[i]
        cols += [s / AMP[i], 1j * s, t * s, 2j * np.pi * t * s]
    D = np.array(cols).T
    fim = 2 / noise_var * np.real(D.conj().T @ D)
    return np.diag(np.linalg.inv(fim)).reshape(len(AMP), 4)


def first_mode(fit):
    """Frequency and damping of the estimated mode nearest the first true one."""
    if len(fit.frequency) == 0:
        return np.nan, np.nan
    i = np.argmin(np.abs(fit.frequency - FREQ[0]))
    return fit.frequency[i], fit.damping[i]


def strongest(fit, k):
    keep = np.argsort(-fit.amplitude)[:k]
    return fit._replace(**{f: getattr(fit, f)[keep] for f in fit._fields if f != "mse"})


METHODS = {
    "matrix pencil (L=n/3, M=2)": lambda x: qdm.matrix_pencil(x, modes=2),
    "Prony, order 2": lambda x: qdm.prony(x, order=2),
    "Prony, order 8 (2 strongest)": lambda x: strongest(qdm.prony(x, order=8), 2),
}
rng = np.random.default_rng(15)
mse = {m: np.zeros((len(SNRS), 2)) for m in METHODS}
bound = np.zeros((len(SNRS), 2))
warnings.simplefilter("ignore", qdm.RankDeficientWarning)
for k, snr in enumerate(SNRS):
    var = AMP[0] ** 2 / 10 ** (snr / 10)
    c = crb(var)
    bound[k] = c[0, 3], c[0, 2]
    errs = {m: [] for m in METHODS}
    for _ in range(trials):
        x = clean + np.sqrt(var / 2) * (rng.standard_normal(N) + 1j * rng.standard_normal(N))
        for m, fit in METHODS.items():
            try:
                f, d = first_mode(fit(x))
            except qdm.Error:
                f, d = np.nan, np.nan
            errs[m].append((f - FREQ[0], d - DAMP[0]))
    for m in METHODS:
        e = np.array(errs[m])
        mse[m][k] = np.nanmean(e ** 2, axis=0)

print(f"MSE / CRB of the first mode, n = {N}, {trials} trials per SNR")
print(f"{'SNR dB':>6}  " + "  ".join(f"{m[:28]:>28}" for m in METHODS))
print(f"{'':6}  " + "  ".join(f"{'freq':>13} {'damping':>14}" for _ in METHODS))
for k, snr in enumerate(SNRS):
    print(f"{snr:6d}  " + "  ".join(f"{mse[m][k, 0] / bound[k, 0]:13.2f} "
                                    f"{mse[m][k, 1] / bound[k, 1]:14.2f}" for m in METHODS))

fig, axes = plt.subplots(1, 2, figsize=(10, 4.2))
for j, (ax, what) in enumerate(zip(axes, ("frequency (cycles/sample)^2", "damping (1/sample)^2"))):
    for m, style in zip(METHODS, ("o-", "s-", "^-")):
        ax.semilogy(SNRS, mse[m][:, j], style, ms=4, label=m)
    ax.semilogy(SNRS, bound[:, j], "k--", label="Cramer-Rao bound")
    ax.set(xlabel="SNR (dB)", ylabel=f"MSE, {what}", title=("frequency" if j == 0 else "damping")
           + f" of mode 1 (f = {FREQ[0]}, alpha = {DAMP[0]})")
    ax.grid(True, which="both", alpha=0.3)
# The legend goes below both panels, clear of the curves.
fig.legend(*axes[0].get_legend_handles_labels(), loc="lower center", ncol=4, fontsize=8,
           frameon=False)
fig.suptitle(f"qdm: two damped exponentials in white noise, n = {N}, {trials} trials per SNR",
             fontsize=10)
fig.tight_layout(rect=(0, 0.06, 1, 1))
fig.savefig(out, dpi=100)
print(f"wrote {out}")
