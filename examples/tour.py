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
    """Frequency (Hz) and damping (per sample) of the poles in the upper half plane."""
    z = poles[(poles.imag > 0)]
    z = z[np.argsort(-np.abs(z))][:3]
    return np.angle(z) * fs / (2 * np.pi), np.log(np.abs(z))


order = qdm.mdl_order(x, max_order=40)
cov = qdm.covariance(x, order=12)
pc = qdm.pcar(x, order=12, components=6)
pr = qdm.prony(x, order=6, fs=fs, real_signal=True)
mp = qdm.matrix_pencil(x, modes=6, fs=fs, real_signal=True)
cs = qdm.covariance_psd(x, order=12, points=1024, fs=fs)
ps = qdm.pcar_psd(x, order=12, components=6, points=1024, fs=fs, real_signal=True)

print(f"{n} samples at {fs:g} Hz; MDL order (matrix pencil, L = 40): {order}")
print(f"{'method':16} {'frequency Hz':>12} {'damping/s':>10} {'amplitude':>10} {'phase':>7}")
for f, a, d in truth:
    print(f"{'truth':16} {f:12.2f} {-d:10.2f} {a / 2:10.4f} {0:7.3f}")
rows = [("prony", pr.frequency, pr.damping * fs, pr.amplitude, pr.phase),
        ("matrix_pencil", mp.frequency, mp.damping * fs, mp.amplitude, mp.phase),
        ("pcar_psd", ps.frequency, [np.nan] * len(ps.frequency), ps.amplitude, ps.phase)]
for name, poles in (("covariance", cov.poles), ("pcar", pc.roots)):
    f, d = pole_modes(poles)
    rows.append((name, f, d * fs, [np.nan] * len(f), [np.nan] * len(f)))
for name, f, d, a, p in rows:
    for i in np.argsort(f):
        print(f"{name:16} {f[i]:12.2f} {d[i]:10.2f} {a[i]:10.4f} {p[i]:7.3f}")
print("(amplitudes are |A| of x[t] = sum A z^t: half a real sinusoid's; "
      "the AR fits give poles only)")

fig, ax = plt.subplots(figsize=(8, 4.2))
for s, label in ((cs, "covariance AR, order 12"), (ps, "principal-component AR, order 12, 6 components")):
    keep = s.frequencies >= 0
    ax.plot(s.frequencies[keep], s.spectrum[keep], label=label)
for f, *_ in truth:
    ax.axvline(f, color="0.8", lw=3, zorder=0)
ax.plot(mp.frequency, np.full(len(mp.frequency), 2.0), "v", color="C2", label="matrix pencil modes")
ax.plot(pr.frequency, np.full(len(pr.frequency), 5.0), "v", color="C3", label="Prony modes")
ax.plot(ps.frequency, np.full(len(ps.frequency), 8.0), "v", color="C1", label="PCAR modes")
ax.set(xlabel="frequency (Hz)", ylabel="power (dB, peak 0)", xlim=(0, fs / 2), ylim=(-70, 12),
       title="qdm: three damped sinusoids (grey: true frequencies)")
ax.legend(loc="lower left", fontsize=8)
fig.tight_layout()
out = sys.argv[1] if len(sys.argv) > 1 else "docs/images/tour.png"
fig.savefig(out, dpi=100)
print(f"wrote {out}")
