"""qdm: parametric time-series estimators on numpy arrays.

Every fit takes one 1-D array. Its dtype picks the real (float64) or the
complex (complex128) fit; other numeric dtypes that numpy casts safely to one
of them (bool, integers, float16/32, complex64) are converted, anything else
raises DTypeError. Contiguous float64 and complex128 arrays are passed to the
library as they are, without a copy, and the GIL is released during the fit.

Modes follow the model x[t] = sum A_i z_i^t: amplitude |A_i|, phase arg(A_i)
in radians, damping ln|z_i| per sample (negative when decaying), frequency
arg(z_i) fs / (2 pi) in Hz. Spectra are in dB with the peak at 0 dB, on the
axis `frequencies` = -fs/2 + arange(N) fs/N, N the power of two not below
`points`.
"""
import ctypes as _ct
import operator as _op
import warnings as _warnings
from typing import NamedTuple

import numpy as _np

from qdm._lib import functions as _fn, lib as _clib, status_text

__all__ = ["covariance", "pcar", "prony", "matrix_pencil", "mdl_order", "covariance_psd",
           "pcar_psd", "Error", "ArgumentError", "DTypeError", "OutOfMemoryError",
           "NumericError", "NonFiniteResultError", "RankDeficientWarning", "status_text", "__version__",
           "CovarianceFit", "PcarFit", "PronyFit", "PencilFit", "CovarianceSpectrum",
           "PcarSpectrum"]

__version__ = _clib.qdm_version().decode()


# ---- errors ------------------------------------------------------------------------
class Error(Exception):
    """Base of every qdm exception. `code` is the library's status (None when
    the binding refused the call before reaching the library), `text` its
    meaning from qdm_status_text(), `function` the fit that failed."""

    def __init__(self, code, text, function):
        self.code, self.text, self.function = code, text, function
        super().__init__(f"{function}: {text}" if code is None
                         else f"{function}: {code}: {text}")


class ArgumentError(Error, ValueError):
    """A bad argument: the library's -424xx codes, or a shape the binding refuses."""


class DTypeError(Error, TypeError):
    """An input whose dtype has no lossless conversion to float64 or complex128."""


class OutOfMemoryError(Error, MemoryError):
    """The library could not allocate its work memory (-20001)."""


class NumericError(Error):
    """A numeric failure inside the fit (LAPACK, the root finder, extreme values)."""


class NonFiniteResultError(NumericError, FloatingPointError):
    """The fit ran, but a result came out NaN or infinite (-30001): a degenerate
    record (zero, constant, a spike, a ramp) or a result beyond the range of
    float64. No partial results are returned."""


class RankDeficientWarning(UserWarning):
    """The fit succeeded, but a least-squares system inside it was rank deficient
    (minimum-norm solution used): code 20001. The results are complete."""

    def __init__(self, code, text, function):
        self.code, self.text, self.function = code, text, function
        super().__init__(f"{function}: {code}: {text}")


_NO_MEMORY = -20001
_RANK_DEFICIENT = 20001
_NON_FINITE_RESULT = -30001


def _check(status, function):
    if status == 0:
        return
    text = status_text(status)
    if status == _RANK_DEFICIENT:
        _warnings.warn(RankDeficientWarning(status, text, function), stacklevel=3)
        return
    if -42499 <= status <= -42400:
        raise ArgumentError(status, text, function)
    if status == _NO_MEMORY:
        raise OutOfMemoryError(status, text, function)
    if status == _NON_FINITE_RESULT:
        raise NonFiniteResultError(status, text, function)
    raise NumericError(status, text, function)


# ---- arguments -----------------------------------------------------------------------
_F64 = _np.dtype(_np.float64)
_C128 = _np.dtype(_np.complex128)
_INT32_MIN, _INT32_MAX = -2**31, 2**31 - 1


def _signal(x, function):
    """x as a C-contiguous float64 or complex128 vector, without a copy when it
    already is one; and whether it is complex."""
    a = x if type(x) is _np.ndarray else _np.asarray(x)
    dt = a.dtype
    if dt is _F64 or dt is _C128:
        if a.ndim == 1 and a.flags.c_contiguous and a.flags.aligned:
            if a.shape[0] > _INT32_MAX:
                raise ArgumentError(None, "more than 2^31 - 1 samples", function)
            return a, dt is _C128
    elif _np.can_cast(dt, _F64, "safe"):
        dt = _F64
    elif _np.can_cast(dt, _C128, "safe"):
        dt = _C128
    else:
        raise DTypeError(None, f"dtype {dt} has no lossless conversion to float64 or "
                               "complex128", function)
    if a.ndim != 1:
        raise ArgumentError(None, f"x must be one-dimensional, not {a.ndim}-D "
                                  f"of shape {a.shape}", function)
    if a.shape[0] > _INT32_MAX:
        raise ArgumentError(None, "more than 2^31 - 1 samples", function)
    return _np.ascontiguousarray(a, dtype=dt), dt is _C128


def _int(v):
    """An integer argument as int32. Values beyond int32 are pinned to its ends,
    which every range check of the library refuses with its own code."""
    v = _op.index(v)
    return _INT32_MIN if v < _INT32_MIN else _INT32_MAX if v > _INT32_MAX else v


def _room(v, n):
    """Output room for a size argument v, as the library states it
    (qdm_output_room): an absurd request never becomes a huge allocation."""
    return _clib.qdm_output_room(n, v)


def _real_flag(real_signal, is_complex, function):
    if real_signal and is_complex:
        raise ArgumentError(None, "real_signal applies to real data only", function)
    return 1 if real_signal else 0


def _fs(fs):
    return float(fs)


_addressof, _from_buffer = _ct.addressof, _ct.c_char.from_buffer


def _addr(a):
    """The address of a contiguous array's first element. ctypes' own buffer
    view costs a third of numpy's .ctypes.data, but needs a writable array."""
    try:
        return _addressof(_from_buffer(a))
    except (TypeError, ValueError):  # read-only or empty
        return a.ctypes.data


def _kind(c):
    return "complex" if c else "real"


# ---- results -------------------------------------------------------------------------
class CovarianceFit(NamedTuple):
    coefficients: _np.ndarray  # a[0..p], a[0] = 1
    poles: _np.ndarray         # p complex poles
    noise_variance: float


class PcarFit(NamedTuple):
    coefficients: _np.ndarray
    roots: _np.ndarray


class PronyFit(NamedTuple):
    amplitude: _np.ndarray
    phase: _np.ndarray
    damping: _np.ndarray
    frequency: _np.ndarray


class PencilFit(NamedTuple):
    amplitude: _np.ndarray
    phase: _np.ndarray
    damping: _np.ndarray
    frequency: _np.ndarray
    mse: float


class CovarianceSpectrum(NamedTuple):
    frequencies: _np.ndarray   # Hz
    spectrum: _np.ndarray      # dB, peak 0 dB
    noise_variance: float


class PcarSpectrum(NamedTuple):
    frequencies: _np.ndarray
    spectrum: _np.ndarray
    amplitude: _np.ndarray
    phase: _np.ndarray
    frequency: _np.ndarray
    fit_error: float


def _modes(rows, k):
    """Room for k values of each of `rows` mode arrays, in one allocation, and
    the addresses of its rows."""
    block = _np.empty((rows, max(k, 1)))
    base, stride = _addressof(_from_buffer(block)), block.strides[0]
    return block, [base + i * stride for i in range(rows)]


def _axis(f0, df, count):
    return f0 + _np.arange(count) * df


# ---- the fits ------------------------------------------------------------------------
def covariance(x, *, order):
    """Covariance-method AR model of order p (1 <= p <= 2n/3): forward linear
    prediction solved in the least-squares sense, without windowing."""
    x, c = _signal(x, "covariance")
    n, p = x.shape[0], _int(order)
    m = _room(p, n)
    coef = _np.empty(m + 1, _C128 if c else _F64)
    poles = _np.empty(max(m, 1), _C128)
    nv = _ct.c_double()
    _check(_fn["covariance", _kind(c)](_addr(x), n, p, _addr(coef), _addr(poles),
                                       _ct.byref(nv)), "covariance")
    return CovarianceFit(coef, poles[:m], nv.value)


_SOLVERS = {"auto": 0, "dense": 1, "krylov": 2}


def _solver(solver, where):
    if not isinstance(solver, str) or solver not in _SOLVERS:
        raise ArgumentError(None, f"solver must be one of {sorted(_SOLVERS)}, not {solver!r}",
                            where)


def pcar(x, *, order, components, solver="auto"):
    """Principal-component AR model: forward-backward linear prediction solved
    through the pseudo-inverse kept to the `components` strongest singular
    components.

    `solver` picks how the 2(n - order)-by-order data matrix's leading
    singular triplets are found: "dense" forms it and takes its SVD
    (O(n order^2)), "krylov" takes the components + 1 leading ones by Lanczos
    over FFT products without forming it (O(n log n) per product, for long
    records at large orders), "auto" (the default) whichever is estimated to
    be faster. Both give the same coefficients to rounding wherever the
    kept components stand clear of the next."""
    x, c = _signal(x, "pcar")
    _solver(solver, "pcar")
    n, p, k = x.shape[0], _int(order), _int(components)
    m = _room(p, n)
    coef = _np.empty(m + 1, _C128 if c else _F64)
    roots = _np.empty(max(m, 1), _C128)
    _check(_fn["pcar_solver", _kind(c)](_addr(x), n, p, k, _SOLVERS[solver], _addr(coef),
                                        _addr(roots)), "pcar")
    return PcarFit(coef, roots[:m])


def prony(x, *, order, fs=1.0, real_signal=False):
    """Prony's method: `order` damped exponentials, poles from a covariance AR
    model, amplitudes by least squares. real_signal (real data only) reports
    one mode per conjugate pair."""
    x, c = _signal(x, "prony")
    n, p = x.shape[0], _int(order)
    block, rows = _modes(4, _room(p, n))
    count = _ct.c_int32()
    args = (_addr(x), n, p, _fs(fs))
    flag = _real_flag(real_signal, c, "prony")
    if not c:
        args += (flag,)
    _check(_fn["prony", _kind(c)](*args, *rows, _ct.byref(count)), "prony")
    return PronyFit(*block[:, :count.value])


def matrix_pencil(x, *, modes, pencil=None, fs=1.0, real_signal=False, solver="auto"):
    """Matrix pencil method: `modes` damped exponentials from the (n - L)-by-L
    data matrix and its shift, L = `pencil` (default n // 3). When `modes`
    exceeds min(n - L, L) fewer are returned.

    `solver` picks how the data matrix's leading singular triplets are found:
    "dense" forms and decomposes it (O(n L^2)), "krylov" takes them by Lanczos
    over FFT products without forming it (O(n log n) per product, for long
    records), "auto" (the default) whichever is estimated to be faster."""
    x, c = _signal(x, "matrix_pencil")
    _solver(solver, "matrix_pencil")
    n = x.shape[0]
    L = _clib.qdm_default_pencil(n) if pencil is None else _int(pencil)
    M = _int(modes)
    block, rows = _modes(4, _room(M, n))
    count, mse = _ct.c_int32(), _ct.c_double()
    args = (_addr(x), n, L, M, _fs(fs))
    flag = _real_flag(real_signal, c, "matrix_pencil")
    if not c:
        args += (flag,)
    args += (_SOLVERS[solver],)
    _check(_fn["matrix_pencil_solver", _kind(c)](*args, *rows, _ct.byref(count),
                                                  _ct.byref(mse)), "matrix_pencil")
    return PencilFit(*block[:, :count.value], mse.value)


def mdl_order(x, *, max_order=None, min_order=1):
    """The order with the lowest minimum-description-length score among
    min_order..min(n - L, L), L = max_order (default n // 3), scored on
    matrix-pencil fits. Returns an int: 0 when no order scores below 10000."""
    x, c = _signal(x, "mdl_order")
    n = x.shape[0]
    upper = n // 3 if max_order is None else _int(max_order)
    order = _ct.c_int32(0)
    _check(_fn["mdl_order", _kind(c)](_addr(x), n, upper, _int(min_order),
                                      _ct.byref(order)), "mdl_order")
    return order.value


def covariance_psd(x, *, order, points=512, fs=1.0):
    """Power spectrum 1/|A(f)|^2 of the covariance AR model in dB (peak 0 dB)
    at N frequencies from -fs/2, N the power of two not below `points`; N below
    order + 1 raises ArgumentError (-42422)."""
    x, c = _signal(x, "covariance_psd")
    n, p, pts = x.shape[0], _int(order), _int(points)
    N = _clib.qdm_spectrum_length(pts)
    db = _np.empty(max(N, 1))
    f0, df, nv = _ct.c_double(), _ct.c_double(), _ct.c_double()
    _check(_fn["covariance_psd", _kind(c)](_addr(x), n, p, pts, _fs(fs), _addr(db),
                                           _ct.byref(f0), _ct.byref(df), _ct.byref(nv)),
           "covariance_psd")
    return CovarianceSpectrum(_axis(f0.value, df.value, N), db, nv.value)


def pcar_psd(x, *, order, components, points=512, fs=1.0, real_signal=False):
    """Power spectrum of the principal-component AR model in dB (peak 0 dB), and
    the `components` modes whose poles lie nearest the unit circle (nearest
    first), amplitudes fitted by least squares. No damping is reported. N below
    order + 1 raises ArgumentError (-42422)."""
    x, c = _signal(x, "pcar_psd")
    n, p, k, pts = x.shape[0], _int(order), _int(components), _int(points)
    N = _clib.qdm_spectrum_length(pts)
    db = _np.empty(max(N, 1))
    block, rows = _modes(3, _room(k, n))
    count = _ct.c_int32()
    f0, df, err = _ct.c_double(), _ct.c_double(), _ct.c_double()
    args = (_addr(x), n, p, pts, k, _fs(fs))
    flag = _real_flag(real_signal, c, "pcar_psd")
    if not c:
        args += (flag,)
    _check(_fn["pcar_psd", _kind(c)](*args, *rows, _ct.byref(count), _addr(db),
                                     _ct.byref(f0), _ct.byref(df), _ct.byref(err)), "pcar_psd")
    return PcarSpectrum(_axis(f0.value, df.value, N), db, *block[:, :count.value], err.value)
