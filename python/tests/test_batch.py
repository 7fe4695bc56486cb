"""Batches: an N-D x is fitted slice by slice along axis in one library call.
Every record's results must equal the 1-D call on that record bit for bit,
for any axis, layout and thread count; a record that fails keeps its failure
to itself; what is wrong for every record raises."""
import warnings

import numpy as np
import pytest

import qdm

N = 96


def _records(shape, complex_=False, seed=0):
    """Damped sinusoids in noise, a different record in every slot."""
    rng = np.random.default_rng(seed)
    t = np.arange(N)
    f = rng.uniform(0.05, 0.2, shape + (1,))
    x = np.exp(-0.01 * t) * np.cos(2 * np.pi * f * t) + 0.5 * np.cos(2 * np.pi * (f + 0.17) * t)
    x = x + 0.05 * rng.standard_normal(shape + (N,))
    if complex_:
        x = x * np.exp(1j * rng.uniform(0, 6, shape + (1,))) + 0.05j * rng.standard_normal(x.shape)
    return x


# (name, call, fields whose rows are per record, shared fields)
FITS = [
    ("covariance", lambda x, **k: qdm.covariance(x, order=6, **k)),
    ("pcar", lambda x, **k: qdm.pcar(x, order=10, components=4, **k)),
    ("prony", lambda x, **k: qdm.prony(x, order=6, fs=100.0, **k)),
    ("prony_real_signal", lambda x, **k: qdm.prony(x, order=4, real_signal=np.isrealobj(x), **k)),
    ("matrix_pencil", lambda x, **k: qdm.matrix_pencil(x, modes=4, fs=10.0, **k)),
    ("pencil_unsorted_krylov", lambda x, **k: qdm.matrix_pencil(x, modes=4, pencil=40,
                                                                sort=False, solver="krylov", **k)),
    ("mdl_order", lambda x, **k: qdm.mdl_order(x, **k)),
    ("covariance_psd", lambda x, **k: qdm.covariance_psd(x, order=6, nfft=100, fs=2.0, **k)),
    ("pcar_psd", lambda x, **k: qdm.pcar_psd(x, order=10, components=4, nfft=64, **k)),
]
SHARED = {"frequencies"}


def _quiet(call, *args, **kwargs):
    with warnings.catch_warnings():
        warnings.simplefilter("ignore")
        return call(*args, **kwargs)


def _one(call, record):
    """The 1-D call on one record as a tuple of fields (mdl_order: (order, status))."""
    r = _quiet(call, record)
    return (r, 0) if isinstance(r, int) else r


def _same(got, want):
    """Bit for bit, NaN where NaN: numpy's equality with equal_nan, which for
    float64 is exact."""
    np.testing.assert_array_equal(np.asarray(got), np.asarray(want), strict=False)


def _check_record(batch, index, want):
    """Field by field, record `index` of the batch against the 1-D result
    `want`, whose mode arrays are its batch row before the NaN padding."""
    names = getattr(want, "_fields", ("order", "status"))
    for name, w in zip(names, want):
        g = getattr(batch, name) if hasattr(batch, "_fields") else batch[names.index(name)]
        if name in SHARED:
            _same(g, w)
            continue
        g = np.asarray(g)[index]
        if np.ndim(w) == 1 and g.ndim == 1 and g.shape[0] > np.shape(w)[0]:
            assert np.isnan(g[len(w):].real).all(), name  # padding past the record's modes
            g = g[:len(w)]
        _same(g, w)


@pytest.mark.parametrize("name,call", FITS, ids=[f[0] for f in FITS])
@pytest.mark.parametrize("shape,complex_,axis", [((3, 4), False, -1), ((3, 4), False, 0),
                                                  ((5,), True, -1), ((5,), True, 0)])
def test_every_record_equals_its_1d_call(name, call, shape, complex_, axis):
    x = _records(shape, complex_)
    if name == "prony_real_signal" and complex_:
        pytest.skip("real_signal applies to real data only")
    data = np.moveaxis(x, -1, axis)
    got = _quiet(call, data, axis=axis)
    for index in np.ndindex(shape):
        _check_record(got, index, _one(call, x[index]))


@pytest.mark.parametrize("name,call", FITS, ids=[f[0] for f in FITS])
def test_a_bad_record_keeps_its_failure_and_the_others_complete(name, call):
    x = _records((5,))
    x[1, 7] = np.nan
    x[3] = 0.0
    got = _quiet(call, x)
    assert got.status[1] == -42419
    with pytest.raises(qdm.Error) as e:  # as the 1-D call refuses it
        _quiet(call, x[1])
    assert e.value.code == -42419
    for i in (0, 2, 4):
        assert got.status[i] in (0, 20001)
        _check_record(got, i, _one(call, x[i]))
    # The zero record: whatever the 1-D call does, its entry says it.
    try:
        want = _one(call, x[3])
    except qdm.Error as err:
        assert got.status[3] == err.code < 0
        values = [np.asarray(v)[3] for k, v in zip(got._fields, got)
                  if k not in SHARED | {"status", "mode_count", "order"}]
        assert all(np.isnan(v.real).all() for v in values)
        if "mode_count" in got._fields:
            assert got.mode_count[3] == 0
    else:
        _check_record(got, 3, want)


@pytest.mark.parametrize("name,call", FITS, ids=[f[0] for f in FITS])
def test_threads_give_the_same_bits(name, call):
    x = _records((7,), complex_=True, seed=4)
    one, two, every = (_quiet(call, x, workers=w) for w in (None, 2, -1))
    for a, b, c in zip(one, two, every):
        _same(a, b)
        _same(a, c)


def test_a_strided_view_is_read_in_place_and_gives_what_a_copy_gives():
    x = _records((6,))
    wide = np.zeros((6, 2 * N))
    wide[:, 10:10 + N] = x
    view = wide[:, 10:10 + N]                 # rows 2N apart
    same = np.broadcast_to(x[2], (4, N))     # distance 0: one record four times
    _same(qdm.matrix_pencil(view, modes=4).frequency, qdm.matrix_pencil(x, modes=4).frequency)
    f = qdm.matrix_pencil(same, modes=4).frequency
    _same(f, np.tile(qdm.matrix_pencil(x[2], modes=4).frequency, (4, 1)))
    # A column-major array, an int dtype and a reversed axis are copied.
    _same(qdm.covariance(np.asfortranarray(x), order=4).poles, qdm.covariance(x, order=4).poles)
    _same(qdm.covariance(x[::-1], order=4).poles, qdm.covariance(x, order=4).poles[::-1])
    ints = np.arange(2 * N).reshape(2, N) % 7
    _same(qdm.covariance(ints, order=3).poles[1], qdm.covariance(ints[1], order=3).poles)


@pytest.mark.parametrize("name,call", FITS, ids=[f[0] for f in FITS])
def test_an_empty_batch_returns_empty_arrays(name, call):
    got = _quiet(call, np.zeros((0, N)))
    assert got.status.shape == (0,)
    for k, v in zip(got._fields, got):
        if k not in SHARED:
            assert np.shape(v)[0] == 0, k
    assert _quiet(call, np.zeros((2, 0, N))).status.shape == (2, 0)


def test_mode_errors_of_a_batch_equal_those_of_each_record():
    x = _records((2, 3), complex_=True, seed=7)
    fit = qdm.matrix_pencil(x, modes=3, fs=5.0, sort=False)
    got = qdm.mode_errors(x, fit, fs=5.0, workers=2)
    for index in np.ndindex(2, 3):
        one = qdm.matrix_pencil(x[index], modes=3, fs=5.0, sort=False)
        want = qdm.mode_errors(x[index], one, fs=5.0)
        for g, w in zip(got, want):
            _same(np.asarray(g)[index], w)
        _same(fit.frequency_stderr[index], got.frequency_stderr[index])
    # A NaN mode is its record's status, as the 1-D call raises it.
    modes = [np.array(v) for v in fit[:4]]
    modes[3][0, 1, 0] = np.nan
    bad = qdm.mode_errors(x, modes, fs=5.0)
    assert bad.status[0, 1] == -42425 and np.isnan(bad.noise_variance[0, 1])
    assert (np.delete(bad.status.ravel(), 1) == 0).all()


def test_warnings_come_once_per_batch_and_count_the_records():
    x = np.tile(np.cos(0.3 * np.arange(64)), (4, 1))  # two modes, fitted with four poles
    with warnings.catch_warnings(record=True) as w:
        warnings.simplefilter("always")
        fit = qdm.covariance(x, order=4)
    assert (fit.status == 20001).all()
    assert [type(m.message) for m in w] == [qdm.RankDeficientWarning]
    assert "(4 of 4 records)" in str(w[0].message)
    assert w[0].filename == __file__


RAISES = [
    (lambda: qdm.covariance(_records((3,)), order=90), qdm.ArgumentError, -42412, "order 90"),
    (lambda: qdm.matrix_pencil(_records((3,)), modes=5, pencil=4), qdm.ArgumentError, -42413,
     "modes 5 is above pencil"),
    (lambda: qdm.pcar_psd(_records((3,)), order=4, components=2, nfft=1), qdm.ArgumentError,
     -42417, "nfft 1"),
    (lambda: qdm.covariance_psd(_records((3,)), order=6, nfft=4), qdm.ArgumentError, -42422,
     "nfft 4"),
    (lambda: qdm.prony(_records((3,)), order=4, fs=-1.0), qdm.ArgumentError, -42418, "fs -1"),
    (lambda: qdm.covariance(_records((3,)), order=4, axis=2), qdm.ArgumentError, None,
     "axis 2 is out of range"),
    (lambda: qdm.covariance(_records((3,)), order=4, axis=1.0), TypeError, None, "axis must"),
    (lambda: qdm.covariance(np.ones(8), order=2, axis=1), qdm.ArgumentError, None, "axis 1"),
    (lambda: qdm.covariance(_records((3,)), order=4, workers=0), qdm.ArgumentError, None,
     "workers 0"),
    (lambda: qdm.covariance(_records((3,)), order=4, workers=-100000), qdm.ArgumentError, None,
     "workers -100000"),
    (lambda: qdm.covariance(_records((3,)), order=4, workers="2"), TypeError, None, "workers"),
    (lambda: qdm.covariance(_records((3,)).astype(object), order=4), qdm.DTypeError, None,
     "object"),
    (lambda: qdm.mode_errors(_records((3,)), ([1.0], [0.0], [0.0], [0.1])), qdm.ArgumentError,
     None, "batch shape (3,)"),
    (lambda: qdm.matrix_pencil(_records((3,)), modes=2, solver="qr"), qdm.ArgumentError, None,
     "solver"),
]


@pytest.mark.parametrize("call,exc,code,text", RAISES, ids=range(len(RAISES)))
def test_an_argument_wrong_for_every_record_raises_naming_it(call, exc, code, text):
    e = pytest.raises(exc, call).value
    assert text in str(e)
    if code is not None:
        assert e.code == code


def test_one_dimensional_input_keeps_its_scalars_and_mdl_its_int():
    x = _records(())
    fit = qdm.matrix_pencil(x, modes=4, workers=2, axis=0)
    assert type(fit.mse) is float and fit.status == 0 and fit.mode_count == 4
    assert type(qdm.mdl_order(x)) is int
    got = qdm.mdl_order(x[None, :])
    assert isinstance(got, qdm.MdlOrder) and got.order.dtype == np.int32


def test_a_spectrum_that_fails_after_its_fit_is_its_records_failure():
    x = np.stack([_records(())[:12], np.arange(12.0), _records((), seed=3)[:12]])
    got = _quiet(qdm.covariance_psd, x, order=2, nfft=16)
    with pytest.raises(qdm.NonFiniteResultError):  # a ramp: a pole on the unit circle
        _quiet(qdm.covariance_psd, x[1], order=2, nfft=16)
    assert got.status[1] == -30001 and np.isnan(got.psd[1]).all()
    for i in (0, 2):
        _check_record(got, i, _quiet(qdm.covariance_psd, x[i], order=2, nfft=16))
