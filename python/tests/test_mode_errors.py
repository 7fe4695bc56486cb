"""Standard errors of modes: against a finite-difference Jacobian in numpy, the
closed-form bound of one tone, a noise-free record, bad input, and a Monte
Carlo of the matrix pencil."""
import warnings

import numpy as np
import pytest

import qdm

N = 120
FS = 50.0
T = np.arange(N)


def complex_model(theta, fs):
    """sum a e^{j phi} e^{(alpha + j 2 pi f / fs) t} over rows (a, phi, alpha, f)."""
    x = np.zeros(N, complex)
    for a, ph, d, f in theta.reshape(-1, 4):
        x += a * np.exp(1j * ph + (d + 2j * np.pi * f / fs) * T)
    return x


def real_model(theta, kinds, fs):
    """Cosines 2 a e^{alpha t} cos(2 pi f t / fs + phi) (kind 4: a, phi, alpha, f)
    and real terms a cos(phi) e^{alpha t} at 0 Hz (kind 2: a, alpha; phase 0)."""
    x, k = np.zeros(N), 0
    for kind in kinds:
        if kind == 4:
            a, ph, d, f = theta[k:k + 4]
            x += 2 * a * np.exp(d * T) * np.cos(2 * np.pi * f * T / fs + ph)
        else:
            a, d = theta[k:k + 2]
            x += a * np.exp(d * T)
        k += kind
    return x


def jacobian(model, theta):
    cols = []
    for j in range(theta.size):
        h = 1e-6 * max(1.0, abs(theta[j]))
        e = np.zeros(theta.size)
        e[j] = h
        cols.append((model(theta + e) - model(theta - e)) / (2 * h))
    return np.array(cols).T


MODES = np.array([[1.0, 0.3, -0.01, 5.0], [0.5, -1.0, -0.02, 12.0], [0.8, 2.0, 0.0, 17.5]])


def test_complex_errors_are_those_of_a_numeric_jacobian():
    rng = np.random.default_rng(1)
    theta = MODES.ravel()
    x = complex_model(theta, FS) + 0.05 * (rng.standard_normal(N) + 1j * rng.standard_normal(N))
    got = qdm.mode_errors(x, tuple(MODES.T), fs=FS)
    s2 = np.sum(abs(x - complex_model(theta, FS)) ** 2) / (N - 2 * 3)
    J = jacobian(lambda th: complex_model(th, FS), theta)
    Jr = np.vstack([J.real, J.imag])
    expected = np.sqrt(np.diag(s2 / 2 * np.linalg.inv(Jr.T @ Jr))).reshape(3, 4).T
    np.testing.assert_allclose(got.noise_variance, s2, rtol=1e-12)
    np.testing.assert_allclose(got[:4], expected, rtol=1e-6)
    np.testing.assert_allclose(got.damping_per_s_stderr, expected[2] * FS, rtol=1e-6)


# Two cosines and a decaying real term at 0 Hz, as one mode per pair
# (real_signal) or as every pole of the real record.
@pytest.mark.parametrize("real_signal", [True, False])
def test_real_errors_are_those_of_a_numeric_jacobian(real_signal):
    rng = np.random.default_rng(2)
    kinds = [4, 4, 2]
    theta = np.array([1.0, 0.3, -0.01, 5.0, 0.5, -1.0, -0.02, 12.0, 0.7, -0.05])
    model = lambda th: real_model(th, kinds, FS)  # noqa: E731
    x = model(theta) + 0.05 * rng.standard_normal(N)
    s2 = np.sum((x - model(theta)) ** 2) / (N - 10)
    J = jacobian(model, theta)
    se = np.sqrt(np.diag(s2 * np.linalg.inv(J.T @ J)))
    expected = np.array([se[0:4], se[4:8], [se[8], 0.0, se[9], 0.0]]).T
    modes = np.array([[1.0, 0.3, -0.01, 5.0], [0.5, -1.0, -0.02, 12.0], [0.7, 0.0, -0.05, 0.0]])
    if not real_signal:  # the conjugate partners, in another order
        modes = np.vstack([modes, [[1.0, -0.3, -0.01, -5.0], [0.5, 1.0, -0.02, -12.0]]])
        expected = np.hstack([expected, expected[:, :2]])
        order = [3, 0, 2, 4, 1]
        modes, expected = modes[order], expected[:, order]
    got = qdm.mode_errors(x, tuple(modes.T), fs=FS, real_signal=real_signal)
    np.testing.assert_allclose(got.noise_variance, s2, rtol=1e-12)
    np.testing.assert_allclose(got[:4], expected, rtol=1e-6, atol=0)


@pytest.mark.parametrize("n, a, f, phase", [(64, 1.0, 0.11, 0.4), (257, 0.3, -0.37, -2.0)])
def test_one_tone_has_the_closed_form_frequency_bound(n, a, f, phase):
    # var(omega) = 6 s2 / (a^2 n (n^2 - 1)) for complex noise of variance s2; at
    # zero damping the {omega, phi} block of the four-parameter bound decouples
    # from {a, alpha}, so its frequency term is exactly this.
    rng = np.random.default_rng(n)
    t = np.arange(n)
    x = a * np.exp(1j * (2 * np.pi * f * t + phase))
    x = x + 0.1 * (rng.standard_normal(n) + 1j * rng.standard_normal(n))
    got = qdm.mode_errors(x, ([a], [phase], [0.0], [f]))
    var_omega = 6 * got.noise_variance / (a * a * n * (n * n - 1))
    np.testing.assert_allclose(2 * np.pi * got.frequency_stderr[0], np.sqrt(var_omega),
                               rtol=1e-6)


@pytest.mark.parametrize("dtype", [np.float64, np.complex128])
def test_a_noise_free_record_gives_errors_at_rounding_level(dtype):
    t = np.arange(256)
    x = np.exp(-0.01 * t) * np.cos(0.7 * t + 0.2) + 0.3 * np.exp(-0.002 * t) * np.cos(2.1 * t)
    if dtype is np.complex128:
        x = np.exp((-0.01 + 0.7j) * t) + 0.3j * np.exp((-0.002 - 2.1j) * t)
    fit = qdm.matrix_pencil(x.astype(dtype), modes=4 if dtype is np.float64 else 2)
    assert fit.mse < 1e-26
    assert np.all(np.array(fit[6:11]) < 1e-11)
    assert qdm.mode_errors(x, fit).noise_variance < 1e-26


FITS = [lambda x, sort: qdm.matrix_pencil(x, modes=3, sort=sort),
        lambda x, sort: qdm.prony(x, order=3, sort=sort)]


@pytest.mark.parametrize("fit", FITS, ids=["matrix_pencil", "prony"])
def test_fields_follow_the_modes_when_sorted(fit):
    rng = np.random.default_rng(3)
    t = np.arange(200)
    x = (np.exp((-0.01 + 2.0j) * t) + 0.5 * np.exp((-0.02 - 1.0j) * t)
         + 0.2 * np.exp(0.3j * t)
         + 0.02 * (rng.standard_normal(200) + 1j * rng.standard_normal(200)))
    raw, ordered = fit(x, False), fit(x, True)
    i = np.argsort(raw.frequency, kind="stable")
    assert not np.array_equal(i, np.arange(3))
    for name in ("amplitude", "phase", "damping", "frequency", "damping_per_s"):
        np.testing.assert_array_equal(getattr(raw, name + "_stderr")[i],
                                      getattr(ordered, name + "_stderr"))
    np.testing.assert_array_equal(qdm.mode_errors(x, raw)[:5], raw[-7:-2])


GOOD = ([1.0], [0.0], [0.0], [0.1])
BAD = [
    (np.zeros(0, complex), GOOD, {}, -42401),
    (np.ones(8, complex), ([], [], [], []), {}, -42416),
    (np.ones(8, complex), GOOD, {"fs": 0.0}, -42418),
    (np.array([1.0, np.nan, 0.0, 1.0, 2.0]), GOOD, {"real_signal": True}, -42419),
    (np.ones(8, complex), ([1.0], [np.nan], [0.0], [0.1]), {}, -42425),
    (np.ones(8, complex), ([1.0], [0.0], [np.inf], [0.1]), {}, -42425),
    (np.ones(8), GOOD, {}, -42425),  # a real record's pole without its conjugate
    (np.ones(6, complex), ([1.0] * 3, [0.0] * 3, [0.0] * 3, [0.1, 0.2, 0.3]), {}, -42424),
    (np.ones(4), GOOD, {"real_signal": True}, -42424),  # n = 4 parameters
    (np.ones(8, complex), ([1.0], [0.0], [0.0], [0.1, 0.2]), {}, None),
    (np.ones(8, complex), GOOD, {"real_signal": True}, None),
    (np.ones(8, complex), GOOD[:3], {}, None),
]


@pytest.mark.parametrize("x, modes, kw, code", BAD)
def test_bad_input_is_an_argument_error(x, modes, kw, code):
    with pytest.raises(qdm.ArgumentError) as e:
        qdm.mode_errors(x, modes, **kw)
    assert e.value.code == code
    if code is not None:
        assert e.value.text == qdm.status_text(code)


def test_a_singular_bound_gives_nan_for_its_modes_and_a_warning():
    t = np.arange(64)
    x = np.exp(0.5j * t) + np.exp(1.5j * t)
    modes = ([1.0, 1.0, 1.0], [0.0, 0.0, 0.0], [0.0, 0.0, 0.0], [1.5, 1.5, 0.5])
    with pytest.warns(qdm.SingularBoundWarning) as w:
        got = qdm.mode_errors(x, modes, fs=2 * np.pi)
    assert w[0].message.code == 20002
    assert np.isnan(np.array(got[:4])[:, :2]).all()
    assert np.isfinite(np.array(got[:4])[:, 2]).all()


def test_a_fit_too_short_for_its_errors_warns_and_keeps_its_modes():
    x = np.cos(0.3 * np.arange(6))
    with pytest.warns(qdm.SingularBoundWarning) as w:
        fit = qdm.prony(x, order=4)
    assert w[0].message.code == -42424
    assert len(fit.frequency) == 4 and np.isnan(fit.frequency_stderr).all()


def test_reported_errors_match_the_spread_of_pencil_fits():
    # 200 records at 30 dB, three complex modes, n = 256: the mean reported
    # error within a factor 4/3 of the spread of the estimates.
    rng = np.random.default_rng(7)
    n, snr_db = 256, 30.0
    t = np.arange(n)
    freq, damp = np.array([0.1, 0.23, -0.3]), np.array([-0.005, -0.01, -0.002])
    clean = sum(np.exp((d + 2j * np.pi * f) * t) for f, d in zip(freq, damp))
    sigma = np.sqrt(10 ** (-snr_db / 10) / 2)
    est, rep = [], []
    for _ in range(200):
        x = clean + sigma * (rng.standard_normal(n) + 1j * rng.standard_normal(n))
        fit = qdm.matrix_pencil(x, modes=3)
        est.append(np.concatenate([fit.frequency, fit.damping]))
        rep.append(np.concatenate([fit.frequency_stderr, fit.damping_stderr]))
    ratio = np.mean(rep, axis=0) / np.std(est, axis=0)
    assert np.all((ratio > 0.75) & (ratio < 1.33)), ratio
