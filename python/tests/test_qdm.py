"""The Python face: the C API's numbers through every fit, a few independent
numpy oracles, and bad input as the right exception with the library's code."""
import ctypes
import os
import warnings
from concurrent.futures import ThreadPoolExecutor

import numpy as np
import pytest

import qdm
import qdm._lib

_m = np.loadtxt(os.path.join(os.path.dirname(__file__), "../../tests/data/marple64.csv"),
                delimiter=",")
COMPLEX = _m[:, 0] + 1j * _m[:, 1]
_t = np.arange(96)
REAL = (np.cos(2 * np.pi * 0.12 * _t) * np.exp(-0.01 * _t) + 0.5 * np.cos(0.62 * np.pi * _t + 1)
        + 0.05 * np.random.default_rng(7).standard_normal(96))

# A handle without prototypes, arguments wrapped by hand: a slip in the package's shows.
RAW = ctypes.CDLL(qdm._lib.lib._name)


def c_api(name, x, *args, outs):
    """qdm_<name>_<kind>(x, n, *args, *out arrays); outs: (length, dtype) of each out array."""
    arrays = [np.zeros(k, dt) for k, dt in outs]
    f = getattr(RAW, f"qdm_{name}_{'complex' if np.iscomplexobj(x) else 'real'}")
    f.restype = ctypes.c_int32
    assert f(*[a.ctypes.data_as(ctypes.c_void_p) if isinstance(a, np.ndarray) else
               ctypes.c_double(a) if isinstance(a, float) else ctypes.c_int32(a)
               for a in (x, len(x), *args, *arrays)]) in (0, 20001)
    return arrays


def c_modes(name, x, k, *args, mse=False):  # amplitude, phase, damping, frequency[, mse]
    out = c_api(name, x, *args, outs=[(k, float)] * 4 + [(1, np.int32)] + [(1, float)] * mse)
    return [o[:out[4][0]] for o in out[:4]] + [e[0] for e in out[5:]]


def c_psd(name, x, *args, k=0):  # frequencies, spectrum[, amplitude, phase, frequency], error
    N = qdm._lib.lib.qdm_spectrum_length(args[1])
    *m, s, f0, df, e = c_api(name, x, *args, outs=([(k, float)] * 3 + [(1, np.int32)]) * bool(k)
                             + [(N, float)] + [(1, float)] * 3)
    return [f0[0] + np.arange(N) * df[0], s] + [o[:m[3][0]] for o in m[:3]] + [e[0]]


def c_ar_psd(x, p, points, fs):  # the covariance fit, then its spectrum laid out
    a, _, v = c_api("covariance", x, p, outs=[(p + 1, x.dtype), (p, complex), (1, float)])
    N = qdm._lib.lib.qdm_spectrum_length(points)
    onesided = int(not np.iscomplexobj(x))
    f = getattr(RAW, f"qdm_ar_psd_{'complex' if np.iscomplexobj(x) else 'real'}")
    out, count = np.zeros((3, N)), np.zeros(1, np.int32)
    assert f(a.ctypes.data_as(ctypes.c_void_p), ctypes.c_int32(p), ctypes.c_double(v[0]),
             ctypes.c_int32(points), ctypes.c_double(fs), ctypes.c_int32(onesided),
             *[r.ctypes.data_as(ctypes.c_void_p) for r in (out[0], out[1], out[2], count)]) == 0
    f, db, psd = out[:, :count[0]]
    return f, psd, db, v[0]


def rs(x, flag):
    return () if np.iscomplexobj(x) else (flag,)


CASES = {
    "covariance": (lambda x: qdm.covariance(x, order=15), lambda x: (lambda a, r, v: (a, r, v[0]))(
        *c_api("covariance", x, 15, outs=[(16, x.dtype), (15, complex), (1, float)]))),
    "pcar": (lambda x: qdm.pcar(x, order=10, components=4),
             lambda x: c_api("pcar", x, 10, 4, outs=[(11, x.dtype), (10, complex)])),
    "prony": (lambda x: qdm.prony(x, order=6, fs=1000.0, sort=False),
              lambda x: c_modes("prony", x, 6, 6, 1000.0, *rs(x, 0))),
    "prony_real_signal": (lambda x: qdm.prony(x, order=6, real_signal=not np.iscomplexobj(x),
                                              sort=False),
                          lambda x: c_modes("prony", x, 6, 6, 1.0, *rs(x, 1))),
    "matrix_pencil": (lambda x: qdm.matrix_pencil(x, modes=4, fs=2.0, sort=False), lambda x: c_modes(
        "matrix_pencil", x, 4, len(x) // 3, 4, 2.0, *rs(x, 0), mse=True)),
    "mdl_order": (lambda x: qdm.mdl_order(x, pencil=16, min_order=2),
                  lambda x: c_api("mdl_order", x, 16, 2, outs=[(1, np.int32)])[0][0]),
    "covariance_psd": (lambda x: qdm.covariance_psd(x, order=12, nfft=100, fs=8.0),
                       lambda x: c_ar_psd(x, 12, 100, 8.0)),
    "pcar_psd": (lambda x: qdm.pcar_psd(x, order=12, components=3, real_signal=False,
                                        return_onesided=False, sort=False),
                 lambda x: c_psd("pcar_psd", x, 12, 512, 3, 1.0, *rs(x, 0), k=3)),
}


@pytest.mark.parametrize("x", [REAL, COMPLEX], ids=["real", "complex"])
@pytest.mark.parametrize("case", CASES)
def test_same_numbers_as_the_c_api_to_the_last_bit(case, x):
    ours, theirs = CASES[case]
    with warnings.catch_warnings():
        warnings.simplefilter("ignore", qdm.RankDeficientWarning)
        got, want = ours(x), theirs(x)
    if case == "mdl_order":
        assert isinstance(got, int) and got == want
        return
    assert len(got) >= len(want)  # the modes' fits add damping_per_s at the end
    for g, w in zip(got, want):
        assert np.asarray(g).tobytes() == np.asarray(w).tobytes(), case


@pytest.mark.parametrize("x,p,k", [(REAL, 6, 4), (COMPLEX, 15, 2)], ids=["real", "complex"])
def test_covariance_and_pcar_are_the_least_squares_and_truncated_svd_solves(x, p, k):
    n = len(x)
    fwd = np.array([x[t - 1::-1][:p] for t in range(p, n)])
    sol, *_ = np.linalg.lstsq(fwd, -x[p:], rcond=None)
    fit = qdm.covariance(x, order=p)
    np.testing.assert_allclose(fit.coefficients[1:], sol, rtol=1e-8, atol=1e-10)
    np.testing.assert_allclose(fit.noise_variance, np.mean(np.abs(x[p:] + fwd @ sol) ** 2),
                               rtol=1e-8)
    assert np.abs(fit.poles[:, None] - np.roots(fit.coefficients)).min(axis=1).max() < 1e-8
    bwd = np.conj(np.array([x[t + 1:t + 1 + p] for t in range(n - p)]))
    U, s, Vh = np.linalg.svd(np.vstack([fwd, bwd]), full_matrices=False)
    rhs = -np.concatenate([x[p:], np.conj(x[:n - p])])
    sol = Vh[:k].conj().T @ ((U[:, :k].conj().T @ rhs) / s[:k])
    got = qdm.pcar(x, order=p, components=k).coefficients[1:]
    np.testing.assert_allclose(got, sol, rtol=1e-8, atol=1e-10)


def test_covariance_spectrum_is_the_model_response():
    s = qdm.covariance_psd(COMPLEX, order=8, nfft=256, fs=4.0)
    np.testing.assert_allclose(s.frequencies, np.fft.fftshift(np.fft.fftfreq(256, 1 / 4.0)))
    a = qdm.covariance(COMPLEX, order=8).coefficients
    db = -20 * np.log10(np.abs(np.polyval(a[::-1], np.exp(-2j * np.pi * s.frequencies / 4.0))))
    np.testing.assert_allclose(s.spectrum, db - db.max(), atol=1e-8)


INPUTS = {"float32": REAL.astype(np.float32), "int16": (REAL * 100).astype(np.int16),
          "bool": REAL > 0, "complex64": COMPLEX.astype(np.complex64), "list": list(REAL),
          "strided": np.repeat(REAL, 2)[::2], "big-endian": REAL.astype(">f8"),
          "float64": REAL, "complex128": COMPLEX}


@pytest.mark.parametrize("x", INPUTS.values(), ids=INPUTS.keys())
def test_lossless_dtypes_are_converted_and_contiguous_ones_not_copied(x):
    a = np.asarray(x)
    assert (qdm._signal(x, "f")[0] is x) == (x is REAL or x is COMPLEX)
    want = qdm.covariance(a.astype(np.result_type(a.dtype, np.float64)), order=4)
    assert np.array_equal(qdm.covariance(x, order=4).coefficients, want.coefficients)


E = qdm.ArgumentError
BAD = [  # call, exception, library code (None: refused before the library)
    (lambda: qdm.covariance(REAL.astype(np.longdouble), order=4), qdm.DTypeError, None),
    (lambda: qdm.covariance(None, order=1), qdm.DTypeError, None),
    (lambda: qdm.covariance(REAL[0], order=4), E, None),
    (lambda: qdm.covariance(np.float64(3.0), order=1), E, None),
    (lambda: qdm.prony(COMPLEX, order=4, real_signal=True), E, None),
    (lambda: qdm.pcar(np.zeros(0, complex), order=0, components=1), E, -42401),
    (lambda: qdm.covariance(np.r_[REAL[:10], np.nan, REAL[11:]], order=4), E, -42419),
    (lambda: qdm.matrix_pencil(COMPLEX * np.inf, modes=2), E, -42419),
    (lambda: qdm.prony(REAL, order=4, fs=np.nan), E, -42419),
    (lambda: qdm.covariance(REAL, order=0), E, -42412),
    (lambda: qdm.covariance(COMPLEX, order=2**40), E, -42412),
    (lambda: qdm.pcar(REAL, order=-1, components=1), E, -42411),
    (lambda: qdm.pcar(REAL, order=4, components=5), E, -42413),
    (lambda: qdm.mdl_order(REAL, min_order=0), E, -42414),
    (lambda: qdm.mdl_order(COMPLEX, pencil=10**9), E, -42415),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=1), E, -42417),
    (lambda: qdm.mdl_order(REAL[:2]), E, -42415),  # no upper order fits two samples
    (lambda: qdm.pcar_psd(COMPLEX, order=4, components=2, fs=0.0), E, -42418),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=2**30), E, -42420),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=4), E, -42422),
    (lambda: qdm.pcar_psd(COMPLEX, order=8, components=2, nfft=5), E, -42422),
    (lambda: qdm.covariance_psd(COMPLEX, order=4, return_onesided=True), E, None),
    (lambda: qdm.pcar_psd(COMPLEX, order=8, components=2, return_onesided=True), E, None),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=64, points=64), E, None),
]


@pytest.mark.parametrize("call,exc,code", BAD, ids=range(len(BAD)))
def test_bad_input_raises_with_the_library_code_and_text(call, exc, code):
    e = pytest.raises(exc, call).value
    assert isinstance(e, qdm.Error) and e.code == code
    if code is not None:
        assert isinstance(e, ValueError) and e.text == qdm.status_text(code)
        assert e.detail and str(e) == f"{e.function}: {e.detail}"


MESSAGES = [  # call, exception, the message exactly: argument, value, limit in the caller's names
    (lambda: qdm.covariance(np.zeros(309), order=300), E,
     "covariance: order 300 is above floor(2n/3) = 206 (n = 309)"),
    (lambda: qdm.covariance(REAL, order=2**40), E,
     "covariance: order 1099511627776 is above floor(2n/3) = 64 (n = 96)"),
    (lambda: qdm.covariance(REAL[:0], order=1), E, "covariance: len(x) 0 is below 1"),
    (lambda: qdm.covariance(np.r_[REAL[:10], np.nan], order=1), E,
     "covariance: x[10] is not finite: nan"),
    (lambda: qdm.pcar(REAL, order=-1, components=1), E, "pcar: order -1 is below 0"),
    (lambda: qdm.pcar(COMPLEX, order=4, components=5), E,
     "pcar: components 5 is above order = 4"),
    (lambda: qdm.prony(REAL, order=0), E, "prony: order 0 is below 1"),
    (lambda: qdm.prony(REAL, order=4, fs=-2.5), E, "prony: fs -2.5 is not positive"),
    (lambda: qdm.prony(REAL, order=4, fs=np.inf), E, "prony: fs inf is not finite"),
    (lambda: qdm.matrix_pencil(REAL, modes=11, pencil=10), E,
     "matrix_pencil: modes 11 is above pencil = 10"),
    (lambda: qdm.matrix_pencil(COMPLEX, modes=0), E, "matrix_pencil: modes 0 is below 1"),
    (lambda: qdm.matrix_pencil(REAL, modes=2, pencil=65), E,
     "matrix_pencil: pencil 65 is above floor(2n/3) = 64 (n = 96)"),
    (lambda: qdm.mdl_order(REAL, pencil=8, min_order=8), E,
     "mdl_order: pencil 8 is not above min_order = 8"),
    (lambda: qdm.mdl_order(REAL, min_order=-2**40), E, "mdl_order: min_order -1099511627776 is below 1"),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=1), E, "covariance_psd: nfft 1 is below 2"),
    (lambda: qdm.covariance_psd(REAL, order=40, nfft=20), E,
     "covariance_psd: nfft 20 gives fewer spectrum values than order + 1 = 41"),
    (lambda: qdm.pcar_psd(COMPLEX, order=8, components=9), E,
     "pcar_psd: components 9 is above order = 8"),
    (lambda: qdm.pcar_psd(COMPLEX, order=8, components=2, fs=0), E,
     "pcar_psd: fs 0 is not positive"),
    (lambda: qdm.covariance(REAL, order=2.5), TypeError, "covariance: order must be an integer, not 2.5"),
    (lambda: qdm.covariance(REAL, order="3"), TypeError,
     "covariance: order must be an integer, not '3'"),
    (lambda: qdm.pcar(REAL, order=8, components=None), TypeError,
     "pcar: components must be an integer, not None"),
    (lambda: qdm.matrix_pencil(REAL, modes=2, pencil=30.0), TypeError,
     "matrix_pencil: pencil must be an integer, not 30.0"),
    (lambda: qdm.mdl_order(REAL, pencil="9"), TypeError,
     "mdl_order: pencil must be an integer, not '9'"),
    (lambda: qdm.covariance_psd(REAL, order=4, nfft=64.5), TypeError,
     "covariance_psd: nfft must be an integer, not 64.5"),
    (lambda: qdm.prony(REAL, order=4, fs="1000"), TypeError,
     "prony: fs must be a real number, not '1000'"),
    (lambda: qdm.covariance(REAL[0], order=4), E,
     "covariance: x must have at least one dimension, not 0-D"),
    (lambda: qdm.prony(COMPLEX, order=4, real_signal=True), E,
     "prony: real_signal=True applies to real data only, not to complex x"),
]


@pytest.mark.parametrize("call,exc,message", MESSAGES, ids=range(len(MESSAGES)))
def test_a_refusal_names_the_argument_its_value_and_the_limit(call, exc, message):
    assert str(pytest.raises(exc, call).value) == message


@pytest.mark.parametrize("call", [
    lambda: qdm.prony(np.zeros(48), order=4),
    lambda: qdm.prony(np.eye(1, 48).ravel() + 0j, order=4),      # a spike: a pole at 0
    lambda: qdm.covariance(REAL * 1e160, order=4),               # variance past 1e308
], ids=range(3))
def test_a_non_finite_result_is_an_error_not_a_number(call):
    e = pytest.raises(qdm.NonFiniteResultError, call).value
    assert isinstance(e, qdm.NumericError) and isinstance(e, FloatingPointError)
    assert e.code == -30001 and e.text == qdm.status_text(-30001)


def test_a_pole_on_the_unit_circle_gives_finite_numbers_or_the_error():
    # A ramp's AR polynomial has a double root at 1, or within rounding of it (which one
    # depends on the BLAS): the spectrum is then infinite at 0 Hz, or huge and finite.
    try:
        f, psd, db, noise, status = qdm.covariance_psd(np.arange(12.0), order=2, nfft=16)
    except qdm.NonFiniteResultError as e:
        assert e.code == -30001
    else:
        assert np.isfinite(db).all() and np.isfinite(f).all() and np.isfinite(noise)
        assert np.isfinite(psd).all()


@pytest.mark.parametrize("scale", [1e155, 1e-165, 2.0**-1000])
def test_records_near_the_ends_of_the_range_give_scaled_results(scale):
    ref, fit = qdm.prony(REAL, order=6), qdm.prony(REAL * scale, order=6)
    np.testing.assert_allclose(fit.amplitude, ref.amplitude * scale, rtol=1e-12)
    np.testing.assert_allclose(fit.frequency, ref.frequency, rtol=1e-12)


def test_rank_deficiency_is_a_warning_with_complete_results():
    with pytest.warns(qdm.RankDeficientWarning) as w:
        fit = qdm.covariance(np.cos(0.3 * np.arange(64)), order=4)
    assert w[0].message.code == 20001 and w[0].message.text == qdm.status_text(20001)
    assert np.all(np.isfinite(fit.coefficients)) and fit.noise_variance < 1e-20


def test_threads_get_the_single_thread_result():
    want = qdm.matrix_pencil(COMPLEX, modes=6)
    with ThreadPoolExecutor(8) as pool:
        got = list(pool.map(lambda _: qdm.matrix_pencil(COMPLEX, modes=6), range(160)))
    assert all(np.array_equal(r.frequency, want.frequency) and r.mse == want.mse for r in got)


@pytest.mark.parametrize("dtype", [float, complex])
def test_the_krylov_route_gives_the_dense_routes_modes(dtype):
    # Three clear modes in noise, long enough for the automatic choice to take the
    # Krylov route: every route gives the same modes to rounding.
    t = np.arange(3000)
    x = sum(a * np.exp((-1e-4 + 2j * np.pi * f) * t)
            for a, f in [(1.0, 0.07), (0.6, 0.21), (0.3, 0.33)])
    x = (x.real if dtype is float else x) + 1e-3 * np.random.default_rng(3).standard_normal(3000)
    fits = {s: qdm.matrix_pencil(x, modes=6, solver=s) for s in ("dense", "krylov", "auto")}
    order = {s: np.argsort(f.frequency) for s, f in fits.items()}
    for s in ("krylov", "auto"):
        for field in ("frequency", "damping", "amplitude"):
            got, want = (getattr(fits[k], field)[order[k]] for k in (s, "dense"))
            np.testing.assert_allclose(got, want, rtol=1e-8, atol=1e-12, err_msg=f"{s} {field}")
    with pytest.raises(qdm.ArgumentError, match="solver"):
        qdm.matrix_pencil(x, modes=6, solver="lanczos")


@pytest.mark.parametrize("dtype", [float, complex])
def test_pcar_gives_the_same_model_on_every_route(dtype):
    # Four modes in noise at a large order, where the automatic choice takes
    # the Krylov route: the same coefficients and roots to rounding.
    t = np.arange(1500)
    x = sum(a * np.exp((-2e-4 + 2j * np.pi * f) * t)
            for a, f in [(1.0, 0.07), (0.6, 0.21), (0.3, 0.33), (0.2, 0.41)])
    x = (x.real if dtype is float else x) + 0.05 * np.random.default_rng(5).standard_normal(1500)
    k = 8 if dtype is float else 4
    fits = {s: qdm.pcar(x, order=500, components=k, solver=s) for s in ("dense", "krylov", "auto")}
    for s in ("krylov", "auto"):
        np.testing.assert_allclose(fits[s].coefficients, fits["dense"].coefficients, rtol=0,
                                   atol=1e-9 * np.linalg.norm(fits["dense"].coefficients))
        got, want = fits[s].roots, fits["dense"].roots
        nearest = np.abs(got[:, None] - want[None, :]).min(axis=1)
        assert nearest.max() < 1e-9, s
    with pytest.raises(qdm.ArgumentError, match="solver"):
        qdm.pcar(x, order=500, components=k, solver="lanczos")
    with pytest.raises(qdm.ArgumentError, match="solver"):
        qdm.pcar(x, order=500, components=k, solver=["dense"])


@pytest.mark.parametrize("kind", ["real", "complex"])
def test_the_order_search_does_not_depend_on_the_record_units(kind):
    # Two damped sinusoids (four exponentials) in noise; before the record was
    # brought to unit power, 1e-8 of it scored one exponential (the error floor
    # stopped the search) and 1e12 of it none.
    rng = np.random.default_rng(5)
    t = np.arange(200)
    x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
         + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0)
         + 0.05 * rng.standard_normal(200))
    if kind == "complex":
        x = x * np.exp(0.3j)
    orders = {k: qdm.mdl_order(x * 10.0**k, pencil=40) for k in range(-10, 13)}
    assert set(orders.values()) == {4}, orders


_long = np.arange(600)
LONG = (sum(np.exp(-0.002 * _long) * np.cos(0.3 * k * _long + k) for k in range(1, 8))
        + 0.3 * np.random.default_rng(3).standard_normal(600))


# The default upper order, min(n // 3, 64) and at least 2, written out: the
# long record's order depends on it (16 gives another).
@pytest.mark.parametrize("x,upper", [(REAL[:3], 2), (REAL[:8], 2), (COMPLEX, 21), (REAL, 32),
                                     (LONG, 64), (LONG + 0.5j * LONG[::-1], 64)],
                         ids=["n3", "n8", "n64", "n96", "n600", "n600c"])
def test_mdl_order_defaults_to_the_capped_third(x, upper):
    assert qdm.mdl_order(x) == qdm.mdl_order(x, pencil=upper)


def test_mdl_order_takes_max_order_as_the_old_name_of_pencil():
    with pytest.warns(DeprecationWarning, match="pencil"):
        assert qdm.mdl_order(REAL, max_order=16) == qdm.mdl_order(REAL, pencil=16)
    with pytest.raises(qdm.ArgumentError, match="pencil only"):
        qdm.mdl_order(REAL, pencil=16, max_order=16)
