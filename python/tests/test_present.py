"""What a scipy user meets first: the units of the modes, their order, and the
spectra's layout and density, each against an oracle of its own."""
import ctypes

import numpy as np
import pytest

import qdm
import qdm._lib

FS = 1000.0
_t = np.arange(200)
# Three damped modes: (frequency Hz, amplitude, decay 1/s, phase).
TRUTH = [(120.0, 1.0, 8.0, 0.3), (210.0, 0.6, 15.0, -1.0), (340.0, 0.4, 5.0, 2.0)]
CLEAN = sum(a * np.exp(-d * _t / FS) * np.cos(2 * np.pi * f * _t / FS + ph)
            for f, a, d, ph in TRUTH)
NOISY = CLEAN + 0.05 * np.random.default_rng(4).standard_normal(len(CLEAN))
ANALYTIC = sum(a * np.exp((-d + 2j * np.pi * f) * _t / FS + 1j * ph) for f, a, d, ph in TRUTH)

MODAL = {  # the fits that report modes, each with what it is given
    "prony": lambda x, **kw: qdm.prony(x, order=6 if np.isrealobj(x) else 3, fs=FS, **kw),
    "matrix_pencil": lambda x, **kw: qdm.matrix_pencil(x, modes=6 if np.isrealobj(x) else 3,
                                                       fs=FS, **kw),
    "pcar_psd": lambda x, **kw: qdm.pcar_psd(x, order=30, components=6 if np.isrealobj(x) else 3,
                                             fs=FS, **kw),
}
FIELDS = ("amplitude", "phase", "frequency", "damping", "damping_per_s")


def _modes(fit):
    return {f: getattr(fit, f) for f in FIELDS if hasattr(fit, f)}


@pytest.mark.parametrize("x", [CLEAN, ANALYTIC], ids=["real", "complex"])
@pytest.mark.parametrize("name", MODAL)
def test_sorted_modes_rebuild_the_record_so_each_keeps_its_own_fields(name, x):
    fit = MODAL[name](x)
    m = _modes(fit)
    assert np.all(np.diff(m["frequency"]) >= 0)
    # Each mode rebuilt from its own row: a row mixed with another's would not sum to x.
    if "damping" in m:
        z = np.exp(m["damping"] + 2j * np.pi * m["frequency"] / FS)
        model = (m["amplitude"] * np.exp(1j * m["phase"]) * z ** _t[:, None]).sum(axis=1)
        np.testing.assert_allclose(model.real if np.isrealobj(x) else model, x, atol=1e-8)
    # The same modes as the library's own order, as whole rows.
    raw = _modes(MODAL[name](x, sort=False))
    rows = sorted(zip(*raw.values()))
    np.testing.assert_array_equal(np.array(sorted(zip(*m.values()))), np.array(rows))


@pytest.mark.parametrize("name", ["prony", "matrix_pencil"])
def test_damping_is_reported_per_second_beside_per_sample(name):
    fit = MODAL[name](CLEAN, real_signal=True)
    np.testing.assert_allclose(fit.frequency, [f for f, *_ in TRUTH], rtol=1e-9)
    np.testing.assert_allclose(fit.damping_per_s, [-d for _, _, d, _ in TRUTH], rtol=1e-7)
    np.testing.assert_allclose(fit.damping, [-d / FS for _, _, d, _ in TRUTH], rtol=1e-7)


def _ar2(n, seed=11):
    """A real AR(2) record with poles 0.9 exp(+-0.6j), and its exact variance."""
    a1, a2 = -2 * 0.9 * np.cos(0.6), 0.81
    e = np.random.default_rng(seed).standard_normal(n + 500)
    x = np.zeros_like(e)
    for t in range(2, len(e)):
        x[t] = e[t] - a1 * x[t - 1] - a2 * x[t - 2]
    return x[500:]


LONG = _ar2(100_000)


@pytest.mark.parametrize("fs", [1.0, 250.0])
@pytest.mark.parametrize("onesided", [True, False])
def test_the_density_integrates_to_the_records_variance(fs, onesided):
    x = LONG if onesided else LONG + 0j
    s = qdm.covariance_psd(x, order=2, nfft=4096, fs=fs)
    power = s.psd.sum() * (s.frequencies[1] - s.frequencies[0])
    assert abs(power / np.var(x) - 1) < 0.05
    assert abs(np.trapz(s.psd, s.frequencies) / np.var(x) - 1) < 0.05


@pytest.mark.parametrize("x", [NOISY, ANALYTIC], ids=["real", "complex"])
@pytest.mark.parametrize("onesided", [True, False, None])
def test_the_density_is_the_model_response_on_scipys_axis(x, onesided):
    if onesided and np.iscomplexobj(x):
        pytest.skip("complex data is two-sided only")
    fit = qdm.covariance(x, order=8)
    s = qdm.covariance_psd(x, order=8, nfft=200, fs=FS, return_onesided=onesided)
    one = np.isrealobj(x) if onesided is None else onesided
    want_f = np.fft.rfftfreq(256, 1 / FS) if one else np.fft.fftshift(np.fft.fftfreq(256, 1 / FS))
    np.testing.assert_array_equal(s.frequencies, want_f)
    A = np.polyval(fit.coefficients[::-1], np.exp(-2j * np.pi * s.frequencies / FS))
    density = fit.noise_variance / FS / np.abs(A) ** 2
    if one:
        density[1:-1] *= 2
    np.testing.assert_allclose(s.psd, density, rtol=1e-9)
    np.testing.assert_allclose(s.spectrum, 10 * np.log10(np.abs(A) ** -2 / np.abs(A).min() ** -2),
                               atol=1e-9)
    assert s.noise_variance == fit.noise_variance


def test_one_sided_spectra_are_the_non_negative_half_of_the_two_sided():
    for f in (lambda **kw: qdm.covariance_psd(NOISY, order=8, **kw),
              lambda **kw: qdm.pcar_psd(NOISY, order=20, components=6, **kw)):
        one, two = f(), f(return_onesided=False)
        half = len(two.frequencies) // 2
        assert len(one.frequencies) == half + 1 and one.frequencies[-1] == 0.5
        np.testing.assert_array_equal(one.spectrum[:-1], two.spectrum[half:])
        assert one.spectrum[-1] == two.spectrum[0]  # -fs/2 is fs/2


def test_points_is_the_old_name_of_nfft():
    with pytest.warns(DeprecationWarning, match="nfft"):
        old = qdm.covariance_psd(NOISY, order=8, points=100)
    new = qdm.covariance_psd(NOISY, order=8, nfft=100)
    assert all(np.array_equal(a, b) for a, b in zip(old, new))
    with pytest.warns(DeprecationWarning, match="nfft"):
        assert len(qdm.pcar_psd(NOISY, order=8, components=2, points=100).frequencies) == 65


# The C function behind the layout, called by hand.
RAW = ctypes.CDLL(qdm._lib.lib._name)
A2 = np.array([1.0, -1.4, 0.81])


def _ar_psd(a=A2, order=2, variance=1.0, points=64, fs=1.0, onesided=1, room=64, null=False):
    out, count = np.zeros((3, room)), np.zeros(1, np.int32)
    ptr = [None] * 4 if null else [r.ctypes.data_as(ctypes.c_void_p) for r in (*out, count)]
    f = RAW.qdm_ar_psd_complex if np.iscomplexobj(a) else RAW.qdm_ar_psd_real
    f.restype = ctypes.c_int32
    status = f(a.ctypes.data_as(ctypes.c_void_p), ctypes.c_int32(order), ctypes.c_double(variance),
               ctypes.c_int32(points), ctypes.c_double(fs), ctypes.c_int32(onesided), *ptr)
    return status, out, count[0]


@pytest.mark.parametrize("kw,status", [
    ({}, 0), ({"null": True}, -42421), ({"points": 1}, -42417), ({"order": -1}, -42411),
    ({"points": 2}, -42422), ({"fs": 0.0}, -42418), ({"fs": np.inf}, -42419),
    ({"variance": np.nan}, -42419), ({"variance": -1.0}, -20061),
    ({"a": A2 + 0j}, -20061), ({"a": A2 + 0j, "onesided": 0}, 0),
    ({"a": np.array([1.0, np.nan, 0.5])}, -42419), ({"points": 2**30, "null": True}, -42420),
    ({"a": np.array([1.0, -2.0, 1.0])}, -30001),  # a double pole at 1: infinite at 0 Hz
], ids=range(14))
def test_the_layout_function_refuses_what_it_cannot_lay_out(kw, status):
    got, out, count = _ar_psd(**kw)
    assert got == status
    if status != 0:
        assert count == 0 and not out.any()


def test_the_models_db_is_the_covariance_spectrums_to_the_bit():
    x = NOISY
    a = qdm.covariance(x, order=10).coefficients
    status, out, count = _ar_psd(a, 10, 1.0, 128, FS, 0, 128)
    db, f0, df, v = np.zeros(128), np.zeros(1), np.zeros(1), np.zeros(1)
    RAW.qdm_covariance_psd_real.restype = ctypes.c_int32
    assert RAW.qdm_covariance_psd_real(x.ctypes.data_as(ctypes.c_void_p), ctypes.c_int32(len(x)),
                                       ctypes.c_int32(10), ctypes.c_int32(128), ctypes.c_double(FS),
                                       *[r.ctypes.data_as(ctypes.c_void_p)
                                         for r in (db, f0, df, v)]) == 0
    assert status == 0 and count == 128
    assert out[1].tobytes() == db.tobytes()
    np.testing.assert_array_equal(out[0], f0[0] + np.arange(128) * df[0])
