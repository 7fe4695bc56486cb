"""A tour of qdm from Python: one test signal fitted with every method, a table
of the modes, and the two AR spectra drawn with the modes marked.

    python3 examples/tour.py [out.png]     (default docs/images/tour.png)"""
import sys

import matplotlib

matplotlib.use("Agg")
import matplotlib.pyplot as plt  # noqa: E402
import numpy as np  # noqa: E402

import qdm  # noqa: E402

# Three damped sinusoids in white noise: 128 samples at 1 kHz.
fs, n = 1000.0, 128
t = np.arange(n) / fs
truth = [(120.0, 1.0, 8.0), (210.0, 0.6, 15.0), (340.0, 0.4, 5.0)]  # Hz, amplitude, 1/s
x = sum(a * np.exp(-d * t) * np.cos(2 * np.pi * f * t) for f, a, d in truth)
x = x + 0.05 * np.random.default_rng(2024).standard_normal(n)


def pole_modes(poles):
    """Frequency (Hz) and damping (1/s) of the three poles in the upper half plane
    nearest the unit circle: the AR fits give poles, not modes."""
    z = poles[(poles.imag > 0)]
    z = z[np.argsort(-np.abs(z))][:3]
    return np.angle(z) * fs / (2 * np.pi), np.log(np.abs(z)) * fs


order = qdm.mdl_order(x, pencil=40)
cov = qdm.covariance(x, order=12)
pc = qdm.pcar(x, order=12, components=6)
pr = qdm.prony(x, order=6, fs=fs, real_signal=True)
mp = qdm.matrix_pencil(x, modes=6, fs=fs, real_signal=True)
cs = qdm.covariance_psd(x, order=12, nfft=1024, fs=fs)   # one-sided: x is real
ps = qdm.pcar_psd(x, order=12, components=6, nfft=1024, fs=fs, real_signal=True)

print(f"{n} samples at {fs:g} Hz; MDL order (matrix pencil, L = 40): {order}")
print(f"{'method':16} {'frequency Hz':>12} {'damping/s':>10} {'amplitude':>10} {'phase':>7}")
for f, a, d in truth:
    print(f"{'truth':16} {f:12.2f} {-d:10.2f} {a / 2:10.4f} {0:7.3f}")
# The modal fits sort their modes by frequency and give damping in 1/s with fs.
rows = [("prony", pr.frequency, pr.damping_per_s, pr.amplitude, pr.phase),
        ("matrix_pencil", mp.frequency, mp.damping_per_s, mp.amplitude, mp.phase),
        ("pcar_psd", ps.frequency, [np.nan] * len(ps.frequency), ps.amplitude, ps.phase)]
for name, poles in (("covariance", cov.poles), ("pcar", pc.roots)):
    f, d = pole_modes(poles)
    i = np.argsort(f)
    rows.append((name, f[i], d[i], [np.nan] * len(f), [np.nan] * len(f)))
for name, f, d, a, p in rows:
    for i in range(len(f)):
        print(f"{name:16} {f[i]:12.2f} {d[i]:10.2f} {a[i]:10.4f} {p[i]:7.3f}")
print("(amplitudes are |A| of x[t] = sum A z^t: half a real sinusoid's; "
      "the AR fits give poles only)")

fig, ax = plt.subplots(figsize=(8, 4.8))
for s, label in ((cs, "covariance AR, order 12"), (ps, "principal-component AR, order 12, 6 components")):
    ax.plot(s.frequencies, s.spectrum, label=label)
for f, *_ in truth:
    ax.axvline(f, color="0.8", lw=3, zorder=0)
    ax.annotate(f"{f:.1f} Hz", (f, 13.5), ha="center", fontsize=8, color="0.4")
for fit, y, color, label in ((mp, 2.0, "C2", "matrix pencil modes"), (pr, 5.0, "C3", "Prony modes"),
                             (ps, 8.0, "C1", "PCAR modes")):
    ax.plot(fit.frequency, np.full(len(fit.frequency), y), "v", color=color, label=label)
ax.set(xlabel="frequency (Hz)", ylabel="power (dB, peak 0)", xlim=(0, fs / 2), ylim=(-70, 17),
       title="qdm: three damped sinusoids (grey: true frequencies)")
ax.margins(x=0.02)
ax.legend(loc="upper center", bbox_to_anchor=(0.5, -0.16), ncol=3, fontsize=8, frameon=False)
fig.tight_layout()
out = sys.argv[1] if len(sys.argv) > 1 else "docs/images/tour.png"
fig.savefig(out, dpi=100)
print(f"wrote {out}")
