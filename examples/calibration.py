"""Calibration of the standard errors the fits report.

Monte Carlo over SNRs from 0 to 40 dB: three damped modes, n = 256 samples,
complex exponentials in complex white Gaussian noise and real cosines
(fitted with real_signal) in real white Gaussian noise, each by the matrix
pencil and by Prony's method (as many poles as the record has). For every
mode's frequency and damping it compares the mean standard error the fit
reports with the standard deviation of the estimates over the realisations,
and counts how often the interval estimate +- 1.96 reported errors holds the
true value. SNR is the first mode's power over the noise power.

    python3 examples/calibration.py [out.png] [trials]   (default docs/images/calibration.png, 500)"""
import sys
import warnings

import matplotlib

matplotlib.use("Agg")
import matplotlib.pyplot as plt  # noqa: E402
import numpy as np  # noqa: E402

import qdm  # noqa: E402

N = 256
AMP = np.array([1.0, 0.8, 0.6])
PHASE = np.array([0.3, -1.1, 2.0])
DAMP = np.array([-0.005, -0.01, -0.008])  # per sample
FREQ = np.array([0.10, 0.18, 0.31])       # cycles per sample
SNRS = np.arange(0, 41, 10)               # dB
out = sys.argv[1] if len(sys.argv) > 1 else "docs/images/calibration.png"
trials = int(sys.argv[2]) if len(sys.argv) > 2 else 500
t = np.arange(N)
envelope = AMP[:, None] * np.exp(DAMP[:, None] * t)
angle = 2 * np.pi * FREQ[:, None] * t + PHASE[:, None]
CLEAN = {"complex": (envelope * np.exp(1j * angle)).sum(axis=0),
         "real": (2 * envelope * np.cos(angle)).sum(axis=0)}
POWER = {"complex": AMP[0] ** 2, "real": 2 * AMP[0] ** 2}  # first mode's power

FITS = {
    "pencil": lambda x, real: qdm.matrix_pencil(x, modes=6 if real else 3, real_signal=real),
    "prony": lambda x, real: qdm.prony(x, order=6 if real else 3, real_signal=real),
}


def matched(fit):
    """Frequency, damping and their errors of the fitted mode nearest each true
    one (rows: mode; NaN where the fit has none)."""
    rows = np.full((len(FREQ), 4), np.nan)
    if len(fit.frequency) == 0:
        return rows
    for i, f in enumerate(FREQ):
        k = np.argmin(np.abs(fit.frequency - f))
        rows[i] = (fit.frequency[k], fit.damping[k], fit.frequency_stderr[k],
                   fit.damping_stderr[k])
    return rows


def study(method, kind, rng):
    """Per SNR: ratio mean(se)/sd and coverage, shape (snr, mode, parameter)."""
    real = kind == "real"
    ratio = np.empty((len(SNRS), len(FREQ), 2))
    cover = np.empty_like(ratio)
    for s, snr in enumerate(SNRS):
        sigma = np.sqrt(POWER[kind] / 10 ** (snr / 10))
        runs = np.empty((trials, len(FREQ), 4))
        for r in range(trials):
            if real:
                noise = sigma * rng.standard_normal(N)
            else:
                noise = sigma / np.sqrt(2) * (rng.standard_normal(N)
                                              + 1j * rng.standard_normal(N))
            with warnings.catch_warnings():
                warnings.simplefilter("ignore")
                runs[r] = matched(FITS[method](CLEAN[kind] + noise, real))
        est, se = runs[:, :, :2], runs[:, :, 2:]
        truth = np.stack([FREQ, DAMP], axis=1)
        ratio[s] = np.nanmean(se, axis=0) / np.nanstd(est, axis=0)
        inside = np.abs(est - truth) <= 1.96 * se
        cover[s] = np.nanmean(np.where(np.isnan(se), np.nan, inside), axis=0)
    return ratio, cover


def main():
    rng = np.random.default_rng(2024)
    results = {(m, k): study(m, k, rng) for m in FITS for k in ("complex", "real")}
    print(f"{trials} realisations per SNR, n = {N}, 3 modes; ratio = mean reported se / "
          "empirical sd, coverage of +-1.96 se (each the range over the three modes)")
    print(f"{'method':8} {'data':8} {'SNR dB':>6}  {'ratio f':>11}  {'ratio alpha':>11}  "
          f"{'cover f':>11}  {'cover alpha':>11}")
    for (m, k), (ratio, cover) in results.items():
        for s, snr in enumerate(SNRS):
            cells = [f"{a.min():.2f}-{a.max():.2f}" for a in
                     (ratio[s, :, 0], ratio[s, :, 1], cover[s, :, 0], cover[s, :, 1])]
            print(f"{m:8} {k:8} {snr:6d}  " + "  ".join(f"{c:>11}" for c in cells))

    fig, axes = plt.subplots(1, 2, figsize=(11, 4.6))
    colors = {("pencil", "complex"): "#1f5fa8", ("pencil", "real"): "#5fa8d3",
              ("prony", "complex"): "#c0392b", ("prony", "real"): "#e59866"}
    for (m, k), (ratio, cover) in results.items():
        c = colors[m, k]
        for p, style, name in ((0, "-o", "frequency"), (1, "--s", "damping")):
            axes[0].semilogy(SNRS, ratio[:, :, p].mean(axis=1), style, color=c, ms=4,
                             label=f"{m}, {k}, {name}")
            axes[1].plot(SNRS, cover[:, :, p].mean(axis=1), style, color=c, ms=4)
    axes[0].axhspan(0.8, 1.25, color="0.9", zorder=0)
    axes[0].axhline(1.0, color="0.4", lw=0.8)
    axes[0].set(xlabel="SNR (dB)", ylabel="mean reported se / empirical sd",
                title="Reported error against the spread")
    axes[1].axhspan(0.92, 0.98, color="0.9", zorder=0)
    axes[1].axhline(0.95, color="0.4", lw=0.8)
    axes[1].set(xlabel="SNR (dB)", ylabel="coverage of estimate +- 1.96 se", ylim=(0, 1.02),
                title="Coverage of the 95% interval")
    for ax in axes:
        ax.grid(True, which="both", alpha=0.3)
    fig.legend(*axes[0].get_legend_handles_labels(), loc="lower center", ncol=4, fontsize=8,
               frameon=False)
    fig.suptitle(f"Standard errors of three modes, n = {N}, {trials} realisations per SNR "
                 "(mean over the modes; grey: target band)", fontsize=10)
    fig.tight_layout(rect=(0, 0.13, 1, 1))
    fig.savefig(out, dpi=110)
    print(f"wrote {out}")


if __name__ == "__main__":
    main()
