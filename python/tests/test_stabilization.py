"""The stabilization diagram on numpy arrays: true modes stand in columns,
each order's poles are the pencil fit's of that order, the flags follow the
tolerance rule, and bad arguments raise with the library's code and words."""
import numpy as np
import pytest

import qdm

N = 256
FREQS = np.array([-0.21, 0.06, 0.33])  # cycles per sample
DAMPS = np.array([-0.004, -0.01, -0.002])


def three_modes(seed, snr_db=25.0, n=N):
    """Three unit damped complex exponentials in complex white noise at snr_db per mode."""
    rng = np.random.default_rng(seed)
    t = np.arange(n)
    x = sum(np.exp((d + 2j * np.pi * f) * t + 1j * rng.uniform(-np.pi, np.pi))
            for f, d in zip(FREQS, DAMPS))
    sigma = 10 ** (-snr_db / 20) / np.sqrt(2)
    return x + sigma * (rng.standard_normal(n) + 1j * rng.standard_normal(n))


def two_cosines(seed, n=N):
    """A real record: two damped cosines and a decaying offset (a pole at 0 Hz), 25 dB."""
    rng = np.random.default_rng(seed)
    t = np.arange(n)
    x = (np.cos(2 * np.pi * 0.11 * t + 0.3) * np.exp(-0.003 * t)
         + np.cos(2 * np.pi * 0.37 * t - 1.0) + 0.8 * np.exp(-0.006 * t))
    return x + 10 ** (-25 / 20) * rng.standard_normal(n)


@pytest.mark.parametrize("seed", [1, 2, 3, 4, 5])
@pytest.mark.parametrize("fs", [1.0, 480.0])
def test_three_modes_stand_in_stable_columns(seed, fs):
    x = three_modes(seed)
    d = qdm.stabilization(x, max_order=14, fs=fs)
    for m in range(4, 15):
        rows = d.order == m
        assert rows.sum() == m
        for f in FREQS * fs:
            hit = np.abs(d.frequency[rows] - f) <= 0.01 * max(abs(f), fs / N)
            assert (hit & d.stable[rows]).any(), (m, f)
    assert d.mdl_order == qdm.mdl_order(x, pencil=14)


@pytest.mark.parametrize("seed", [1, 2, 3])
def test_real_record_columns_with_one_pole_per_pair(seed):
    """With real_signal, one row per pair: the cosines and the 0 Hz pole (its
    frequency tolerance rests on the floor fs/n) are stable from order 6 up."""
    x = two_cosines(seed)
    d = qdm.stabilization(x, max_order=16, real_signal=True, min_order=3)
    assert d.order.min() == 3 and np.all(d.frequency >= 0) and np.all(d.frequency < 0.5)
    for m in range(6, 17):
        rows = d.order == m
        assert rows.sum() <= m
        for f in (0.0, 0.11, 0.37):
            near = np.abs(d.frequency[rows] - f) <= 0.01 * max(f, 1 / N)
            assert (near & d.stable[rows]).any(), (m, f)


@pytest.mark.parametrize("x, kw", [
    (three_modes(11), dict(max_order=10)),
    (three_modes(12), dict(max_order=12, min_order=4, pencil=100)),
    (two_cosines(13), dict(max_order=9, pencil=70)),
    (two_cosines(14), dict(max_order=8, real_signal=True)),
])
def test_each_order_is_the_pencil_fit_of_that_order(x, kw):
    d = qdm.stabilization(x, **kw)
    L = kw.get("pencil", max(len(x) // 3, kw["max_order"]))
    for m in range(kw.get("min_order", 1), kw["max_order"] + 1):
        fit = qdm.matrix_pencil(x, modes=m, pencil=L, solver="dense",
                                real_signal=kw.get("real_signal", False))
        rows = d.order == m
        assert np.allclose(d.frequency[rows], fit.frequency, rtol=0, atol=1e-9)
        assert np.allclose(d.damping[rows], fit.damping, rtol=0, atol=1e-9)
        assert np.allclose(d.amplitude[rows], fit.amplitude, rtol=1e-7, atol=1e-9)


def flags_by_hand(d, n, fs, ftol, dtol):
    """The tolerance rule, pole by pole, over the returned table."""
    sf, sd, st = [], [], []
    for m, f, g in zip(d.order, d.frequency, d.damping):
        below = d.order == m - 1
        fok = np.abs(d.frequency[below] - f) <= ftol * max(abs(f), fs / n)
        dok = np.abs(d.damping[below] - g) <= dtol * max(abs(g), 1 / n)
        sf.append(fok.any())
        sd.append(dok.any())
        st.append((fok & dok).any())
    return np.array(sf), np.array(sd), np.array(st)


@pytest.mark.parametrize("ftol, dtol", [(0.01, 0.05), (0.0, 0.0), (0.1, 0.5), (0.002, 1.0)])
def test_flags_follow_the_tolerance_rule(ftol, dtol):
    x = three_modes(21, snr_db=15)
    d = qdm.stabilization(x, max_order=12, min_order=2, fs=2.0, freq_tol=ftol, damping_tol=dtol)
    sf, sd, st = flags_by_hand(d, N, 2.0, ftol, dtol)
    rows = d.order > 2  # order 2 was compared with order 1, which the table leaves out
    assert np.array_equal(d.stable_frequency[rows], sf[rows])
    assert np.array_equal(d.stable_damping[rows], sd[rows])
    assert np.array_equal(d.stable[rows], st[rows])
    assert np.all(d.stable <= (d.stable_frequency & d.stable_damping))
    assert not d.stable[d.order == 2].all() or dtol > 0  # order 1 exists below order 2


def test_order_one_has_no_flags():
    d = qdm.stabilization(three_modes(3), max_order=5)
    assert d.order[0] == 1 and not d.stable_frequency[0] and not d.stable_damping[0]


E = qdm.ArgumentError
X = three_modes(9, n=64)


@pytest.mark.parametrize("x, kw, code, words", [
    (np.zeros(0), dict(max_order=2), -42401, "len(x) 0 is below 1"),
    (X, dict(max_order=8, pencil=0), -42411, "pencil 0 is below 1"),
    (X, dict(max_order=8, pencil=43), -42411, "pencil 43 is above floor(2n/3) = 42 (n = 64)"),
    (X, dict(max_order=8, min_order=0), -42414, "min_order 0 is below 1"),
    (X, dict(max_order=3, min_order=3), -42415, "max_order 3 is not above min_order = 3"),
    (X, dict(max_order=30, pencil=40), -42415,
     "max_order 30 is above min(pencil, n - pencil) = 24"),
    (X, dict(max_order=2**40), -42415, "max_order 1099511627776 is above"),
    (X, dict(max_order=8, fs=0.0), -42418, "fs 0 is not positive"),
    (X, dict(max_order=8, freq_tol=-0.01), -42426, "freq_tol -0.01 is below 0"),
    (X, dict(max_order=8, damping_tol=-1.0), -42426, "damping_tol -1 is below 0"),
    (X, dict(max_order=8, freq_tol=np.nan), -42419, "freq_tol nan is not finite"),
    (X, dict(max_order=8, damping_tol=np.inf), -42419, "damping_tol inf is not finite"),
    (np.r_[X[:5], np.nan, X[6:]], dict(max_order=8), -42419, "x[5] is not finite"),
    (X, dict(max_order=8, fs=np.inf), -42419, "fs inf is not finite"),
])
def test_bad_arguments_raise_with_code_and_words(x, kw, code, words):
    with pytest.raises(E) as e:
        qdm.stabilization(x, **kw)
    assert e.value.code == code
    assert words in str(e.value), str(e.value)


def test_binding_refusals():
    with pytest.raises(E, match="real_signal"):
        qdm.stabilization(X, max_order=4, real_signal=True)
    with pytest.raises(TypeError, match="max_order"):
        qdm.stabilization(X, max_order=4.5)
    with pytest.raises(TypeError, match="freq_tol"):
        qdm.stabilization(X, max_order=4, freq_tol="1%")
    with pytest.raises(qdm.DTypeError):
        qdm.stabilization(np.array(["a", "b"]), max_order=1)


def test_a_spike_fails_rather_than_giving_nan():
    x = np.zeros(64)
    x[0] = 1.0
    with pytest.raises(qdm.NumericError):
        qdm.stabilization(x, max_order=4)
