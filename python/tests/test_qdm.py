"""The Python face: the C API's numbers through every fit, a few independent
numpy oracles, and bad input as the right exception with the library's code."""
import ctypes
import os
import threading
import warnings

import numpy as np
import pytest

import qdm
import qdm._lib

DATA = os.path.join(os.path.dirname(__file__), "..", "..", "tests", "data", "marple64.csv")
_m = np.loadtxt(DATA, delimiter=",")
COMPLEX = _m[:, 0] + 1j * _m[:, 1]
_t = np.arange(96)
REAL = (np.cos(2 * np.pi * 0.12 * _t) * np.exp(-0.01 * _t) + 0.5 * np.cos(2 * np.pi * 0.31 * _t + 1)
        + 0.05 * np.random.default_rng(7).standard_normal(96))

# A second handle with no declared prototypes: every argument is wrapped here
# by hand, so a slip in the package's declarations shows as a mismatch.
RAW = ctypes.CDLL(qdm._lib.lib._name)


def raw(name, x, *args):
    kind = "complex" if np.iscomplexobj(x) else "real"
    f = getattr(RAW, f"qdm_{name}_{kind}")
    f.restype = ctypes.c_int32
    conv = [a.ctypes.data_as(ctypes.c_void_p) if isinstance(a, np.ndarray) else
            ctypes.c_double(a) if isinstance(a, float) else ctypes.c_int32(a)
            for a in (x, len(x)) + args]
    assert f(*conv) in (0, 20001)


def z(k, dtype=float):
    return np.zeros(k, dtype)


def c_covariance(x, p):
    a, r, v = z(p + 1, x.dtype), z(p, complex), z(1)
    raw("covariance", x, p, a, r, v)
    return a, r, v[0]


def c_pcar(x, p, k):
    a, r = z(p + 1, x.dtype), z(p, complex)
    raw("pcar", x, p, k, a, r)
    return a, r


def c_modes(name, x, *params, rs=None, extra=0):
    k = params[1] if name == "matrix_pencil" else params[0]
    out, cnt, e = [z(k) for _ in range(4)], z(1, np.int32), z(1)
    flag = () if rs is None else (rs,)
    raw(name, x, *params, *flag, *out, cnt, *([e] if extra else []))
    return [o[:cnt[0]] for o in out] + ([e[0]] if extra else [])


def c_mdl(x, upper, low):
    o = z(1, np.int32)
    raw("mdl_order", x, upper, low, o)
    return o[0]


def c_covariance_psd(x, p, pts, fs):
    N = qdm._lib.lib.qdm_spectrum_length(pts)
    s, f0, df, v = z(N), z(1), z(1), z(1)
    raw("covariance_psd", x, p, pts, fs, s, f0, df, v)
    return f0[0] + np.arange(N) * df[0], s, v[0]


def c_pcar_psd(x, p, pts, k, fs, rs=None):
    N = qdm._lib.lib.qdm_spectrum_length(pts)
    s, f0, df, e = z(N), z(1), z(1), z(1)
    a, ph, fr, cnt = z(k), z(k), z(k), z(1, np.int32)
    raw("pcar_psd", x, p, pts, k, fs, *(() if rs is None else (rs,)), a, ph, fr, cnt, s, f0, df, e)
    m = cnt[0]
    return f0[0] + np.arange(N) * df[0], s, a[:m], ph[:m], fr[:m], e[0]


def rs(x, flag):
    return None if np.iscomplexobj(x) else flag


CASES = {
    "covariance": (lambda x: qdm.covariance(x, order=8), lambda x: c_covariance(x, 8)),
    "pcar": (lambda x: qdm.pcar(x, order=10, components=4), lambda x: c_pcar(x, 10, 4)),
    "prony": (lambda x: qdm.prony(x, order=6, fs=1000.0),
              lambda x: c_modes("prony", x, 6, 1000.0, rs=rs(x, 0))),
    "prony_real_signal": (lambda x: qdm.prony(x, order=6, real_signal=not np.iscomplexobj(x)),
                          lambda x: c_modes("prony", x, 6, 1.0, rs=rs(x, 1))),
    "matrix_pencil": (lambda x: qdm.matrix_pencil(x, modes=4, fs=2.0),
                      lambda x: c_modes("matrix_pencil", x, len(x) // 3, 4, 2.0, rs=rs(x, 0),
                                        extra=1)),
    "mdl_order": (lambda x: qdm.mdl_order(x, max_order=16, min_order=2),
                  lambda x: c_mdl(x, 16, 2)),
    "covariance_psd": (lambda x: qdm.covariance_psd(x, order=12, points=100, fs=8.0),
                       lambda x: c_covariance_psd(x, 12, 100, 8.0)),
    "pcar_psd": (lambda x: qdm.pcar_psd(x, order=12, components=3, real_signal=False),
                 lambda x: c_pcar_psd(x, 12, 512, 3, 1.0, rs=rs(x, 0))),
}


@pytest.mark.parametrize("x", [REAL, COMPLEX], ids=["real", "complex"])
@pytest.mark.parametrize("case", CASES)
def test_same_numbers_as_the_c_api(case, x):
    ours, theirs = CASES[case]
    with warnings.catch_warnings():
        warnings.simplefilter("ignore", qdm.RankDeficientWarning)
        got, want = ours(x), theirs(x)
    if case == "mdl_order":
        assert isinstance(got, int) and got == want
        return
    assert len(got) == len(want)
    for g, w in zip(got, want):
        assert np.array_equal(g, w), case  # bit for bit


def test_marple64_covariance_order_15_to_the_last_bit():
    got = qdm.covariance(COMPLEX, order=15)
    a, r, v = c_covariance(COMPLEX, 15)
    assert got.coefficients.tobytes() == a.tobytes() and got.noise_variance == v
    assert got.poles.tobytes() == r.tobytes()


@pytest.mark.parametrize("x,p", [(REAL, 6), (COMPLEX, 15)], ids=["real", "complex"])
def test_covariance_is_the_least_squares_predictor(x, p):
    A = np.array([x[t - 1::-1][:p] for t in range(p, len(x))])
    sol, *_ = np.linalg.lstsq(A, -x[p:], rcond=None)
    fit = qdm.covariance(x, order=p)
    np.testing.assert_allclose(fit.coefficients[1:], sol, rtol=1e-8, atol=1e-10)
    resid = x[p:] + A @ sol
    np.testing.assert_allclose(fit.noise_variance, np.mean(np.abs(resid) ** 2), rtol=1e-8)
    assert np.abs(fit.poles[:, None] - np.roots(fit.coefficients)).min(axis=1).max() < 1e-8


@pytest.mark.parametrize("x,p,k", [(REAL, 10, 4), (COMPLEX, 12, 2)], ids=["real", "complex"])
def test_pcar_is_the_truncated_svd_solve(x, p, k):
    n = len(x)
    fwd = np.array([x[t - 1::-1][:p] for t in range(p, n)])
    bwd = np.conj(np.array([x[t + 1:t + 1 + p] for t in range(n - p)]))
    A, b = np.vstack([fwd, bwd]), -np.concatenate([x[p:], np.conj(x[:n - p])])
    U, s, Vh = np.linalg.svd(A, full_matrices=False)
    sol = Vh[:k].conj().T @ ((U[:, :k].conj().T @ b) / s[:k])
    np.testing.assert_allclose(qdm.pcar(x, order=p, components=k).coefficients[1:], sol,
                               rtol=1e-8, atol=1e-10)


@pytest.mark.parametrize("fit", [
    lambda x: qdm.prony(x, order=2, fs=50.0),
    lambda x: qdm.matrix_pencil(x, modes=2, pencil=10, fs=50.0)], ids=["prony", "pencil"])
def test_noiseless_modes_are_recovered(fit):
    t = np.arange(40)
    x = 1.5 * np.exp(1j * 0.4) * np.exp((-0.02 + 2j * np.pi * 0.11) * t) \
        + 0.7 * np.exp((-0.05 - 2j * np.pi * 0.27) * t)
    r = fit(x)
    order = np.argsort(r.frequency)
    np.testing.assert_allclose(r.frequency[order], [-0.27 * 50, 0.11 * 50], atol=1e-8)
    np.testing.assert_allclose(r.damping[order], [-0.05, -0.02], atol=1e-10)
    np.testing.assert_allclose(r.amplitude[order], [0.7, 1.5], rtol=1e-8)
    np.testing.assert_allclose(r.phase[order], [0.0, 0.4], atol=1e-8)


def test_covariance_spectrum_is_the_model_response():
    s = qdm.covariance_psd(COMPLEX, order=8, points=256, fs=4.0)
    np.testing.assert_allclose(s.frequencies, np.fft.fftshift(np.fft.fftfreq(256, 1 / 4.0)))
    a = qdm.covariance(COMPLEX, order=8).coefficients
    db = -20 * np.log10(np.abs(np.polyval(a[::-1], np.exp(-2j * np.pi * s.frequencies / 4.0))))
    np.testing.assert_allclose(s.spectrum, db - db.max(), atol=1e-8)


@pytest.mark.parametrize("x", [REAL.astype(np.float32), (REAL * 100).astype(np.int16),
                               REAL > 0, COMPLEX.astype(np.complex64), list(REAL),
                               np.repeat(REAL, 2)[::2], REAL.astype(">f8")],
                         ids=["float32", "int16", "bool", "complex64", "list", "strided",
                              "big-endian"])
def test_lossless_dtypes_are_converted(x):
    want_dtype = np.result_type(np.asarray(x).dtype, np.float64)
    want = qdm.covariance(np.asarray(x).astype(want_dtype), order=4)
    got = qdm.covariance(x, order=4)
    assert np.array_equal(got.coefficients, want.coefficients)


def test_contiguous_inputs_are_not_copied():
    for x in (REAL, COMPLEX):
        assert qdm._signal(x, "f")[0] is x


E = qdm.ArgumentError
BAD = [  # call, exception, library code (None: refused before the library)
    (lambda: qdm.covariance(REAL.astype(np.longdouble), order=4), qdm.DTypeError, None),
    (lambda: qdm.covariance(np.array(["1", "2"]), order=1), qdm.DTypeError, None),
    (lambda: qdm.covariance(None, order=1), qdm.DTypeError, None),
    (lambda: qdm.covariance(REAL.reshape(8, 12), order=4), E, None),
    (lambda: qdm.covariance(np.float64(3.0), order=1), E, None),
    (lambda: qdm.prony(COMPLEX, order=4, real_signal=True), E, None),
    (lambda: qdm.covariance(np.array([]), order=1), E, -42401),
    (lambda: qdm.pcar(np.zeros(0, complex), order=0, components=1), E, -42401),
    (lambda: qdm.covariance(np.r_[REAL[:10], np.nan, REAL[11:]], order=4), E, -42419),
    (lambda: qdm.matrix_pencil(COMPLEX * np.inf, modes=2), E, -42419),
    (lambda: qdm.prony(REAL, order=4, fs=np.nan), E, -42419),
    (lambda: qdm.covariance(REAL, order=0), E, -42412),
    (lambda: qdm.covariance(REAL, order=65), E, -42412),
    (lambda: qdm.covariance(COMPLEX, order=2**40), E, -42412),
    (lambda: qdm.pcar(REAL, order=-1, components=1), E, -42411),
    (lambda: qdm.pcar(REAL, order=4, components=5), E, -42413),
    (lambda: qdm.matrix_pencil(REAL, modes=0), E, -42412),
    (lambda: qdm.mdl_order(REAL, min_order=0), E, -42414),
    (lambda: qdm.mdl_order(COMPLEX, max_order=10**9), E, -42415),
    (lambda: qdm.covariance_psd(REAL, order=4, points=1), E, -42417),
    (lambda: qdm.pcar_psd(COMPLEX, order=4, components=2, fs=0.0), E, -42418),
    (lambda: qdm.covariance_psd(REAL, order=4, points=2**30), E, -42420),
]


@pytest.mark.parametrize("call,exc,code", BAD, ids=range(len(BAD)))
def test_bad_input_raises_with_the_library_code_and_text(call, exc, code):
    with pytest.raises(exc) as info:
        call()
    e = info.value
    assert isinstance(e, qdm.Error) and e.code == code
    if code is not None:
        assert isinstance(e, ValueError) and e.text == qdm.status_text(code)
        assert str(code) in str(e) and e.text in str(e)


def test_rank_deficiency_is_a_warning_with_complete_results():
    x = np.cos(0.3 * np.arange(64))
    with pytest.warns(qdm.RankDeficientWarning) as w:
        fit = qdm.covariance(x, order=4)
    assert w[0].message.code == 20001 and w[0].message.text == qdm.status_text(20001)
    assert np.all(np.isfinite(fit.coefficients)) and fit.noise_variance < 1e-20


def test_threads_get_the_single_thread_result():
    want = qdm.matrix_pencil(COMPLEX, modes=6)
    got = [None] * 8

    def work(i):
        got[i] = [qdm.matrix_pencil(COMPLEX, modes=6) for _ in range(20)]
    threads = [threading.Thread(target=work, args=(i,)) for i in range(8)]
    for th in threads:
        th.start()
    for th in threads:
        th.join()
    assert all(np.array_equal(r.frequency, want.frequency) and r.mse == want.mse
               for runs in got for r in runs)
