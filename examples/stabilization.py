"""A stabilization diagram's record, and the columns it shows.

Three damped cosines (60, 145 and 320 Hz at 1 kHz) in white noise, 400
samples. Writes the record as a one-column CSV for the tool, then lists,
from the Python package, the frequencies that stand stable from the MDL
order (exclusive) up to the top order. The picture in the README is the tool's:

    python3 examples/stabilization.py record.csv
    qdm stabilization record.csv --rate 1000 --real-signal --max-order 20 \\
        --plot docs/images/stabilization.png"""
import sys

import numpy as np

import qdm

FS = 1000.0
t = np.arange(400)
x = (np.cos(2 * np.pi * 60 / FS * t + 0.3) * np.exp(-0.004 * t)
     + 0.8 * np.cos(2 * np.pi * 145 / FS * t) * np.exp(-0.002 * t)
     + 0.5 * np.cos(2 * np.pi * 320 / FS * t - 1) * np.exp(-0.006 * t)
     + 0.03 * np.random.default_rng(3).standard_normal(t.size))
np.savetxt(sys.argv[1] if len(sys.argv) > 1 else "record.csv", x)

d = qdm.stabilization(x, max_order=20, fs=FS, real_signal=True)
print(f"MDL order {d.mdl_order}; poles stable at every order above it, up to 20:")
orders = range(d.mdl_order + 1, 21)
for f in np.unique(d.frequency[(d.order == 20) & d.stable].round(1)):
    near = np.abs(d.frequency - f) <= 0.01 * max(f, FS / x.size)
    if all((near & d.stable & (d.order == m)).any() for m in orders):
        print(f"  {f:7.1f} Hz")
