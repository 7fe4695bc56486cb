"""qdm: parametric time-series estimators on numpy arrays.

Fits
----
covariance      covariance-method AR model (forward least-squares prediction)
pcar            principal-component AR model (truncated-SVD forward-backward prediction)
prony           damped exponentials by Prony's method
matrix_pencil   damped exponentials by the matrix pencil method
mdl_order       model order by the minimum description length
covariance_psd  power spectrum of the covariance AR model
pcar_psd        power spectrum of the principal-component AR model, and its modes
stabilization   pencil modes across model orders, the stable ones marked

Every fit takes an array ``x``; every other argument is keyword-only.
Its dtype picks the real (float64) or the complex (complex128) fit; other
numeric dtypes that numpy casts safely to one of them (bool, integers,
float16/32, complex64) are converted, anything else raises DTypeError.
Contiguous float64 and complex128 arrays are passed to the library as they
are, without a copy, and the GIL is released during the fit.

Modes follow the model x[t] = sum_i A_i z_i**t: amplitude |A_i|, phase
arg(A_i) in radians, damping ln|z_i| per sample (negative when decaying) and
``damping_per_s`` = damping * fs, frequency arg(z_i) fs / (2 pi), in Hz when
``fs`` is given and in cycles per sample with the default fs = 1. Modes come
sorted by frequency (``sort=False``: in the library's order). `prony` and
`matrix_pencil` also give each mode's standard errors (``amplitude_stderr``,
...), the Cramer-Rao bound at the fitted modes; `mode_errors` gives them
for any modes.

Spectra come as scipy.signal.welch gives them: ``frequencies`` and, for the
covariance model, ``psd`` in units of x**2/Hz, beside ``spectrum`` in dB with
its peak at 0 dB. Real data gives one-sided spectra (0 to fs/2, N/2 + 1
values) and complex data two-sided ones (-fs/2 + arange(N) fs/N), N the power
of two not below ``nfft``; ``return_onesided=False`` asks real data for the
two-sided form.

Batches
-------
An N-D ``x`` is a batch of records, the 1-D slices along ``axis`` (default
the last), all fitted by one library call on ``workers`` threads (default
one; -1 one per processor). Record i's results are those of the 1-D call on
it, bit for bit, for any thread count; every field gets the batch's shape
in front (a spectrum's frequency axis stays 1-D, shared), mode arrays are
padded with NaN past each record's ``mode_count``. A failure that belongs
to one record (a NaN sample -42419, a degenerate record -30001 or -20068,
a solve that did not converge, no memory -20001) does not raise: it is that
record's entry in the result's ``status`` array (`status_text` reads it),
its values NaN, while the other records complete; 0 and 20001 (rank
deficient, complete; one RankDeficientWarning per batch) are successes. An
argument that is wrong for every record still raises. Rows of a row-strided
float64 or complex128 view are read in place; other layouts are copied.
`stabilization` takes one record only.

Errors are `Error` subclasses carrying the library's status code; a
rank-deficient least-squares solve inside a fit is a `RankDeficientWarning`,
and modes whose error bound is singular a `SingularBoundWarning`.
"""
import ctypes as _ct
import math as _math
import operator as _op
import os as _os
import warnings as _warnings
from typing import Literal, NamedTuple, Optional, Sequence, Union

import numpy as _np
# x's hint is quoted below: help() then shows this alias, not numpy's expansion of it.
from numpy.typing import ArrayLike, NDArray

from qdm._lib import functions as _fn, lib as _clib

__all__ = ["covariance", "pcar", "prony", "matrix_pencil", "mdl_order", "covariance_psd",
           "pcar_psd", "mode_errors", "stabilization", "Error", "ArgumentError", "DTypeError", "OutOfMemoryError",
           "NumericError", "NonFiniteResultError", "RankDeficientWarning", "SingularBoundWarning",
           "status_text", "__version__",
           "CovarianceFit", "PcarFit", "PronyFit", "PencilFit", "CovarianceSpectrum",
           "PcarSpectrum", "ModeErrors", "MdlOrder", "Stabilization"]

__version__: str = _clib.qdm_version().decode()


def status_text(code: int) -> str:
    """The meaning of a library status code.

    Parameters
    ----------
    code : int, -2**31 <= code < 2**31
        A status code, as in `Error.code`: 0 success, 20001 the rank-deficiency
        warning, negative codes errors (-424xx argument errors).

    Returns
    -------
    str
        The library's text for the code; codes it does not know get a general
        text, never an error.

    Raises
    ------
    ctypes.ArgumentError
        `code` is not an integer.

    Examples
    --------
    >>> import qdm
    >>> qdm.status_text(-42418)
    'sampling rate not positive'
    >>> qdm.status_text(0)
    'success'
    """
    return _clib.qdm_status_text(code).decode()


# ---- errors ------------------------------------------------------------------------
class Error(Exception):
    """Base of every qdm exception.

    Catch it to handle any failure of a fit; the subclasses below say what
    kind it was and also derive from the matching built-in exception.

    Attributes
    ----------
    code : int or None
        The library's status code, or None when the binding refused the call
        before it reached the library (wrong dtype, not 1-D, a bad `solver`,
        `real_signal` on complex data).
    text : str
        What went wrong: `status_text(code)`, or the binding's own message.
    function : str
        The fit that failed, e.g. ``"matrix_pencil"``.
    detail : str or None
        For an argument the library refused, which one, its value and the
        limit it broke, with the argument named as this package names it,
        e.g. ``"order 300 is above floor(2n/3) = 206 (n = 309)"``; the message
        is then ``"function: detail"``. None for other errors.

    Examples
    --------
    >>> import qdm
    >>> try:
    ...     qdm.covariance([1.0, 2.0, 3.0], order=5)
    ... except qdm.Error as e:
    ...     print(type(e).__name__, e.code, e.function)
    ...     print(e.text)
    ...     print(e)
    ArgumentError -42412 covariance
    order zero, negative or above floor(2n/3), or components, k or M zero or negative
    covariance: order 5 is above floor(2n/3) = 2 (n = 3)
    """

    def __init__(self, code: Optional[int], text: str, function: str,
                 detail: Optional[str] = None) -> None:
        self.code, self.text, self.function, self.detail = code, text, function, detail
        super().__init__(f"{function}: {detail}" if detail is not None
                         else f"{function}: {text}" if code is None
                         else f"{function}: {code}: {text}")


class ArgumentError(Error, ValueError):
    """A bad argument, refused before the fit ran; also a `ValueError`.

    The library's argument codes -42401 to -42428 (empty input, an order,
    count, size or sampling rate out of range, a NaN or infinite sample, a
    fit that would exceed the library's work-memory bound, ...), or, with
    `code` None, what the binding refuses itself: an input that is not 1-D,
    `real_signal` on complex data, an unknown `solver`.
    """


class DTypeError(Error, TypeError):
    """An input whose dtype has no lossless conversion to float64 or complex128.

    Also a `TypeError`; `code` is None. float128, object arrays, strings and
    None raise it.
    """


class OutOfMemoryError(Error, MemoryError):
    """The library could not allocate its work memory (code -20001); also a `MemoryError`."""


class NumericError(Error):
    """A numeric failure inside the fit.

    A LAPACK iteration that did not converge (-20062), the polynomial root
    finder (-20063, -20116), a matrix with values at the extreme ends of the
    double range (-20068), an illegal LAPACK argument (-20999), the Krylov
    route not converging (-20070), and `NonFiniteResultError` (-30001).
    """


class NonFiniteResultError(NumericError, FloatingPointError):
    """The fit ran, but a result came out NaN or infinite (code -30001).

    Also a `FloatingPointError`. It comes from a degenerate record (zero,
    constant, a spike, a ramp) or a result beyond the range of float64. No
    partial results are returned.
    """


class RankDeficientWarning(UserWarning):
    """The fit succeeded, but a least-squares system inside it was rank deficient.

    Code 20001: the minimum-norm solution was used and the results are
    complete. Raised through `warnings.warn`, so ``warnings.simplefilter``
    silences it or turns it into an error.

    Attributes
    ----------
    code : int
        20001.
    text : str
        `status_text(20001)`.
    function : str
        The fit that warned.

    Examples
    --------
    >>> import warnings, numpy as np, qdm
    >>> x = np.cos(0.3 * np.arange(64))          # two modes, fitted with four poles
    >>> with warnings.catch_warnings(record=True) as w:
    ...     warnings.simplefilter("always")
    ...     fit = qdm.covariance(x, order=4)
    >>> print(w[0].category.__name__, w[0].message.code)
    RankDeficientWarning 20001
    """

    def __init__(self, code: int, text: str, function: str) -> None:
        self.code, self.text, self.function = code, text, function
        super().__init__(f"{function}: {code}: {text}")


class SingularBoundWarning(UserWarning):
    """Standard errors that could not be given: their modes' values are NaN.

    Code 20002: the error bound (the inverse of the Fisher information) is
    singular or badly conditioned for some modes, as for a zero amplitude or
    two equal poles; their four standard errors are NaN, every other value
    is complete. Inside `prony` and `matrix_pencil` it also stands for
    errors that could not be computed at all (then every standard error is
    NaN and `code` says why, e.g. -42424 for too few samples). Raised
    through `warnings.warn`.

    Attributes
    ----------
    code : int
        20002, or the status of the error computation that failed in a fit.
    text : str
        `status_text(code)`.
    function : str
        The function that warned.

    Examples
    --------
    >>> import warnings, numpy as np, qdm
    >>> x = np.exp(0.5j * np.arange(32))
    >>> with warnings.catch_warnings(record=True) as w:
    ...     warnings.simplefilter("always")
    ...     e = qdm.mode_errors(x, ([1.0, 0.0], [0.0, 0.0], [0.0, 0.0], [0.0796, 0.2]))
    >>> print(w[0].category.__name__, w[0].message.code, e.frequency_stderr[1])
    SingularBoundWarning 20002 nan
    """

    def __init__(self, code: int, text: str, function: str) -> None:
        self.code, self.text, self.function = code, text, function
        super().__init__(f"{function}: {code}: {text}")


_NO_MEMORY = -20001
_RANK_DEFICIENT = 20001
_BOUND_SINGULAR = 20002
_NO_BOUND = (-30001, -20068)  # a fit's error bars beyond the double range
_NON_FINITE_RESULT = -30001
_NULL_POINTER = -42421


def _check(status, function, names=(), *given):
    """Raises the error a library status stands for, or warns and returns it. For an argument error,
    `names` pairs the library's argument names with this package's, and
    `given` holds the caller's values in the same order (None: the library's
    value is the caller's): the library's message is told in the caller's terms."""
    if status == 0:
        return 0
    text = status_text(status)
    if status == _RANK_DEFICIENT:
        _warnings.warn(RankDeficientWarning(status, text, function), stacklevel=3)
        return status
    if status == _BOUND_SINGULAR:
        _warnings.warn(SingularBoundWarning(status, text, function), stacklevel=3)
        return status
    if -42499 <= status <= -42400:
        raise ArgumentError(status, text, function, _detail(names, given))
    if status == _NO_MEMORY:
        raise OutOfMemoryError(status, text, function)
    if status == _NON_FINITE_RESULT:
        raise NonFiniteResultError(status, text, function)
    raise NumericError(status, text, function)


def _detail(names, given):
    """The calling thread's last library message, "<argument> <value> <rest>",
    with the argument renamed and a value the binding pinned to int32 given
    back as the caller wrote it."""
    room = _clib.qdm_last_error_message(None, 0) + 1
    buffer = _ct.create_string_buffer(room)
    _clib.qdm_last_error_message(buffer, room)
    detail = buffer.value.decode()
    head, _, rest = detail.partition(" ")
    for (ours, yours), value in zip(names, given + (None,) * len(names)):
        if head == ours:
            number, _, tail = rest.partition(" ")
            if value is not None and number.lstrip("-").isdigit():
                rest = f"{_op.index(value)} {tail}"
            return f"{yours} {rest}"
    return detail


# Library argument names, and this package's for them, fit by fit.
_N = ("n", "len(x)")
_ORDER, _COMPONENTS, _FS = ("order", "order"), ("components", "components"), ("fs", "fs")
_COVARIANCE = (_N, _ORDER)
_PCAR = (_N, _ORDER, _COMPONENTS)
_PRONY = (_N, _ORDER, _FS)
_PENCIL = (_N, ("pencil", "pencil"), ("order", "modes"), _FS)
_MDL = (_N, ("pencil", "pencil"), ("min_order", "min_order"))
_SPECTRUM = (_N, _ORDER, ("points", "nfft"), _COMPONENTS, _FS)
_STABILIZATION = (_N, ("pencil", "pencil"), ("min_order", "min_order"),
                  ("max_order", "max_order"), _FS, ("freq_tol", "freq_tol"),
                  ("damping_tol", "damping_tol"))


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
                raise ArgumentError(None, "x has more than 2^31 - 1 samples", function)
            return a, dt is _C128
    elif _np.can_cast(dt, _F64, "safe"):
        dt = _F64
    elif _np.can_cast(dt, _C128, "safe"):
        dt = _C128
    else:
        raise DTypeError(None, f"x of dtype {dt} has no lossless conversion to float64 or "
                               "complex128", function)
    if a.ndim != 1:
        raise ArgumentError(None, f"x must be one-dimensional, not {a.ndim}-D "
                                  f"of shape {a.shape}" if a.ndim else
                                  "x must have at least one dimension, not 0-D", function)
    if a.shape[0] > _INT32_MAX:
        raise ArgumentError(None, "x has more than 2^31 - 1 samples", function)
    return _np.ascontiguousarray(a, dtype=dt), dt is _C128


def _int(v, name, function):
    """An integer argument as int32. Values beyond int32 are pinned to its ends,
    which every range check of the library refuses with its own code. Anything
    but an integer (2.5, "3", None) is a TypeError naming the argument, as
    numpy and scipy refuse a float where they index."""
    try:
        v = _op.index(v)
    except TypeError:
        raise TypeError(f"{function}: {name} must be an integer, not {v!r}") from None
    return _INT32_MIN if v < _INT32_MIN else _INT32_MAX if v > _INT32_MAX else v


def _room(v, n):
    """Output room for a size argument v, as the library states it
    (qdm_output_room): an absurd request never becomes a huge allocation."""
    return _clib.qdm_output_room(n, v)


def _real_flag(real_signal, is_complex, function):
    if real_signal and is_complex:
        raise ArgumentError(None, "real_signal=True applies to real data only, not to complex x",
                            function)
    return 1 if real_signal else 0


def _fs(fs, function):
    """The sampling rate as a float; a string or anything float() refuses is a
    TypeError naming fs."""
    if not isinstance(fs, (str, bytes)):
        try:
            return float(fs)
        except (TypeError, ValueError):
            pass
    raise TypeError(f"{function}: fs must be a real number, not {fs!r}")


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
_Coefficients = Union[NDArray[_np.float64], NDArray[_np.complex128]]
_Status = Union[int, NDArray[_np.int32]]
_Scalar = Union[float, NDArray[_np.float64]]


class CovarianceFit(NamedTuple):
    """The covariance-method AR model, as `covariance` returns it.

    Attributes
    ----------
    coefficients : ndarray, shape (order + 1,)
        a[0..p] with a[0] = 1, of the model x[t] + a[1] x[t-1] + ... +
        a[p] x[t-p] = e[t]; float64 for real data, complex128 for complex.
    poles : ndarray of complex128, shape (order,)
        The p zeros of z**p + a[1] z**(p-1) + ... + a[p], in the order the
        root finder found them (zero roots first; not sorted, not paired).
    noise_variance : float
        Mean squared forward prediction error over the n - p equations, in
        the units of x squared.
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch every field gains the batch's shape in front: coefficients
    (*batch, order + 1), poles (*batch, order), noise_variance and status
    (*batch).
    """
    coefficients: _Coefficients
    poles: NDArray[_np.complex128]
    noise_variance: _Scalar
    status: _Status


class PcarFit(NamedTuple):
    """The principal-component AR model, as `pcar` returns it.

    Attributes
    ----------
    coefficients : ndarray, shape (order + 1,)
        a[0..p] with a[0] = 1, as for `CovarianceFit`; float64 for real data,
        complex128 for complex.
    roots : ndarray of complex128, shape (order,)
        The p zeros of the AR polynomial, in the order the root finder found
        them (not sorted, not paired).
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch every field gains the batch's shape in front.
    """
    coefficients: _Coefficients
    roots: NDArray[_np.complex128]
    status: _Status


class PronyFit(NamedTuple):
    """Damped exponentials x[t] = sum_i A_i z_i**t, as `prony` returns them.

    Each field is a float64 array with one value per mode reported, sorted
    by frequency (with sort=False: in the order of the poles); the i-th value
    of every field belongs to the same mode.

    Attributes
    ----------
    amplitude : ndarray
        |A_i|, in the units of x.
    phase : ndarray
        arg(A_i) in radians, in (-pi, pi].
    damping : ndarray
        ln|z_i| per sample, negative for a decaying mode.
    frequency : ndarray
        arg(z_i) fs / (2 pi): in Hz when fs is given, in cycles per sample
        with the default fs = 1; in (-fs/2, fs/2], or [0, fs/2) with
        real_signal.
    damping_per_s : ndarray
        damping * fs: the decay rate in 1/s when fs is given (-10.0 is a
        mode whose envelope falls by e every 0.1 s); per sample with the
        default fs = 1.
    amplitude_stderr : ndarray
        Standard error of amplitude, in the units of x: the square root of
        its diagonal entry of the Cramer-Rao bound at the fitted modes, the
        noise variance taken from their residual (see `mode_errors`). Every
        ``*_stderr`` field is NaN for a mode whose bound is singular, and
        for all modes when n is too small to estimate the noise (both with
        a `SingularBoundWarning`).
    phase_stderr : ndarray
        Standard error of phase, in radians.
    damping_stderr : ndarray
        Standard error of damping, per sample.
    frequency_stderr : ndarray
        Standard error of frequency, in Hz when fs is given, else in cycles
        per sample.
    damping_per_s_stderr : ndarray
        damping_stderr * fs, the standard error of `damping_per_s`.
    mode_count : int, or ndarray of int32
        The number of modes reported (the length of the mode arrays); for a
        batch, one per record, 0 for a record that failed.
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch the mode fields are (*batch, order) arrays (the room for
    every mode asked for), each record's modes first and sorted as the 1-D
    call sorts them, NaN after its `mode_count`; the scalars are (*batch).
    """
    amplitude: NDArray[_np.float64]
    phase: NDArray[_np.float64]
    damping: NDArray[_np.float64]
    frequency: NDArray[_np.float64]
    damping_per_s: NDArray[_np.float64]
    amplitude_stderr: NDArray[_np.float64]
    phase_stderr: NDArray[_np.float64]
    damping_stderr: NDArray[_np.float64]
    frequency_stderr: NDArray[_np.float64]
    damping_per_s_stderr: NDArray[_np.float64]
    mode_count: _Status
    status: _Status


class PencilFit(NamedTuple):
    """Damped exponentials x[t] = sum_i A_i z_i**t, as `matrix_pencil` returns them.

    The mode fields are float64 arrays with one value per mode reported,
    sorted by frequency (with sort=False: in the order of the poles); the
    i-th value of every field belongs to the same mode.

    Attributes
    ----------
    amplitude : ndarray
        |A_i|, in the units of x.
    phase : ndarray
        arg(A_i) in radians, in (-pi, pi].
    damping : ndarray
        ln|z_i| per sample, negative for a decaying mode.
    frequency : ndarray
        arg(z_i) fs / (2 pi): in Hz when fs is given, in cycles per sample
        with the default fs = 1; in (-fs/2, fs/2], or [0, fs/2) with
        real_signal.
    mse : float
        Mean squared error of the fitted modes against the record, in the
        units of x squared.
    damping_per_s : ndarray
        damping * fs: the decay rate in 1/s when fs is given; per sample
        with the default fs = 1.
    amplitude_stderr : ndarray
        Standard error of amplitude, in the units of x: the square root of
        its diagonal entry of the Cramer-Rao bound at the fitted modes, the
        noise variance taken from their residual (see `mode_errors`). Every
        ``*_stderr`` field is NaN for a mode whose bound is singular, and
        for all modes when n is too small to estimate the noise (both with
        a `SingularBoundWarning`).
    phase_stderr : ndarray
        Standard error of phase, in radians.
    damping_stderr : ndarray
        Standard error of damping, per sample.
    frequency_stderr : ndarray
        Standard error of frequency, in Hz when fs is given, else in cycles
        per sample.
    damping_per_s_stderr : ndarray
        damping_stderr * fs, the standard error of `damping_per_s`.
    mode_count : int, or ndarray of int32
        The number of modes reported (the length of the mode arrays); for a
        batch, one per record, 0 for a record that failed.
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch the mode fields are (*batch, modes) arrays (the room for
    every mode asked for), each record's modes first and sorted as the 1-D
    call sorts them, NaN after its `mode_count`; the scalars are (*batch).
    """
    amplitude: NDArray[_np.float64]
    phase: NDArray[_np.float64]
    damping: NDArray[_np.float64]
    frequency: NDArray[_np.float64]
    mse: _Scalar
    damping_per_s: NDArray[_np.float64]
    amplitude_stderr: NDArray[_np.float64]
    phase_stderr: NDArray[_np.float64]
    damping_stderr: NDArray[_np.float64]
    frequency_stderr: NDArray[_np.float64]
    damping_per_s_stderr: NDArray[_np.float64]
    mode_count: _Status
    status: _Status


class CovarianceSpectrum(NamedTuple):
    """The covariance AR model's power spectrum, as `covariance_psd` returns it.

    Unpacks as ``f, Pxx, db, noise_variance, status``, the first two as
    scipy.signal.welch(x, fs, scaling="density") returns them.

    Attributes
    ----------
    frequencies : ndarray of float64
        The axis, in Hz when fs is given, in cycles per sample with the
        default fs = 1: one-sided arange(N/2 + 1) fs/N (0 to fs/2), or
        two-sided -fs/2 + arange(N) fs/N. N is the power of two not below
        `nfft`.
    psd : ndarray of float64, same shape
        The power spectral density sigma**2 / fs / |A(f)|**2 in units of x
        squared per Hz (per unit of fs), sigma**2 the noise variance;
        one-sided it is doubled at every bin but 0 and fs/2, so that
        ``psd.sum() * fs / N`` (or ``np.trapz(psd, frequencies)``) is the
        model's power, near the record's variance.
    spectrum : ndarray of float64, same shape
        10 log10(1/|A(f)|**2) in dB, shifted so that its peak is exactly
        0 dB (not doubled when one-sided).
    noise_variance : float
        The AR model's prediction-error variance (`CovarianceFit.noise_variance`),
        in the units of x squared.
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch the axis stays 1-D, shared by every record; psd and
    spectrum are (*batch, len(frequencies)), noise_variance and status
    (*batch), as scipy.signal.welch lays out the spectra of N-D data.
    """
    frequencies: NDArray[_np.float64]
    psd: NDArray[_np.float64]
    spectrum: NDArray[_np.float64]
    noise_variance: _Scalar
    status: _Status


class PcarSpectrum(NamedTuple):
    """The principal-component AR spectrum and modes, as `pcar_psd` returns them.

    The mode fields are float64 arrays with one value per mode reported,
    sorted by frequency (with sort=False: nearest the unit circle first).
    No damping is reported, and no density: the principal-component model
    has no prediction-error variance to scale it by.

    Attributes
    ----------
    frequencies : ndarray of float64
        The axis, one-sided (0 to fs/2) or two-sided, as for
        `CovarianceSpectrum`.
    spectrum : ndarray of float64, same shape
        10 log10(1/|A(f)|**2) in dB, peak exactly 0 dB.
    amplitude : ndarray
        |A_i| by least squares, in the units of x.
    phase : ndarray
        arg(A_i) in radians, in (-pi, pi].
    frequency : ndarray
        arg(z_i) fs / (2 pi): in Hz when fs is given, else cycles per sample.
    fit_error : float
        Mean squared error of the amplitude fit, in the units of x squared.
    mode_count : int, or ndarray of int32
        The number of modes reported (the length of the mode arrays); for a
        batch, one per record, 0 for a record that failed.
    status : int, or ndarray of int32
        The fit's status: 0, or 20001 when a least-squares system was rank
        deficient (the results are complete). For a batch, one per record
        (the batch's shape): also a record's error code, its values then
        NaN (see "Batches" in the package's documentation).

    For a batch the axis stays 1-D and shared; spectrum is (*batch,
    len(frequencies)), the mode fields (*batch, components), each record's
    modes first, sorted as the 1-D call sorts them, NaN after its
    `mode_count`; fit_error and the counts (*batch).
    """
    frequencies: NDArray[_np.float64]
    spectrum: NDArray[_np.float64]
    amplitude: NDArray[_np.float64]
    phase: NDArray[_np.float64]
    frequency: NDArray[_np.float64]
    fit_error: _Scalar
    mode_count: _Status
    status: _Status


class ModeErrors(NamedTuple):
    """Standard errors of modes, as `mode_errors` returns them.

    One float64 value per mode, in the order the modes were given; NaN for a
    mode whose bound is singular (with a `SingularBoundWarning`).

    Attributes
    ----------
    amplitude_stderr : ndarray
        Standard error of the amplitude, in the units of x.
    phase_stderr : ndarray
        Standard error of the phase, in radians.
    damping_stderr : ndarray
        Standard error of the damping, per sample.
    frequency_stderr : ndarray
        Standard error of the frequency, in Hz when fs is given (cycles per
        sample with the default).
    damping_per_s_stderr : ndarray
        damping_stderr * fs, in 1/s when fs is given.
    noise_variance : float
        The noise variance the errors rest on, in the units of x squared:
        ||x - model||**2 / (n - 2M) per complex sample for complex data,
        ||x - model||**2 / (n - P) for real data (P real parameters).
    status : int, or ndarray of int32
        0, or 20002 when some modes' bound is singular (their errors NaN).
        For a batch, one per record: also a record's error code (-42425 for
        a NaN or infinite mode value, -42416 for a record without modes,
        ...), its values then NaN.

    For a batch the arrays are (*batch, M) like the modes given, NaN past
    each record's modes; noise_variance and status are (*batch).
    """
    amplitude_stderr: NDArray[_np.float64]
    phase_stderr: NDArray[_np.float64]
    damping_stderr: NDArray[_np.float64]
    frequency_stderr: NDArray[_np.float64]
    damping_per_s_stderr: NDArray[_np.float64]
    noise_variance: _Scalar
    status: _Status


class MdlOrder(NamedTuple):
    """The orders `mdl_order` chooses for a batch of records.

    Attributes
    ----------
    order : ndarray of int32, the batch's shape
        Each record's order, as the 1-D call gives it; 0 for a record that
        failed.
    status : ndarray of int32, the batch's shape
        Each record's status: 0, 20001 (a rank-deficient fit, the order
        complete), or the record's error code.
    """
    order: NDArray[_np.int32]
    status: NDArray[_np.int32]


def _modes(rows, k):
    """Room for k values of each of `rows` mode arrays, in one allocation, and
    the addresses of its rows."""
    block = _np.empty((rows, max(k, 1)))
    base, stride = _addressof(_from_buffer(block)), block.strides[0]
    return block, [base + i * stride for i in range(rows)]


def _order(frequency, sort):
    """The permutation that sorts modes by frequency (stable), or all as they are."""
    return _np.argsort(frequency, kind="stable") if sort else slice(None)


def _errors_call(a, c, fs, flag, rows, count):
    """One call of the library's mode errors for `count` modes whose amplitude,
    phase, damping and frequency arrays start at the addresses `rows`: the
    status, the 4-by-count errors and the noise variance."""
    out = _np.empty((4, max(count, 1)))
    variance = _ct.c_double()
    args: tuple = (_addr(a), a.shape[0], fs) + (() if c else (flag,))
    status = _fn["mode_errors", _kind(c)](*args, count, *rows,
                                          *[_addr(out[q]) for q in range(4)],
                                          _ct.byref(variance))
    return status, out[:, :count], variance.value


def _stderr(a, c, fs, flag, block, count, function):
    """The standard errors of the modes a fit left in block[:, :count], in the
    same order, for the fit's result: an error computation that cannot be
    made (too few samples, unpaired poles, an overflowing model) gives NaN
    with a SingularBoundWarning rather than failing the fit."""
    if count == 0:
        return _np.empty((4, 0))
    status, out, _ = _errors_call(a, c, fs, flag, [_addr(block[q]) for q in range(4)], count)
    if status == 0:
        return out
    if status == _BOUND_SINGULAR or -42499 <= status <= -42400 or status in _NO_BOUND:
        _warnings.warn(SingularBoundWarning(status, status_text(status), function),
                       stacklevel=4)
        if status != _BOUND_SINGULAR:
            out.fill(_np.nan)
        return out
    _check(status, function)


def _nfft(nfft, points, function):
    """The spectrum length asked for: `nfft`, or its old name `points`."""
    if points is None:
        return 512 if nfft is None else _int(nfft, "nfft", function)
    if nfft is not None:
        raise ArgumentError(None, "give nfft only (points is its old name)", function)
    _warnings.warn(f"{function}: points= is now called nfft=, as in scipy.signal; the old "
                   "name will be removed", DeprecationWarning, stacklevel=3)
    return _int(points, "points", function)


def _onesided(return_onesided, is_complex, function):
    """The layout flag: one-sided by default for real data, never for complex."""
    if return_onesided is None:
        return 0 if is_complex else 1
    if return_onesided and is_complex:
        raise ArgumentError(None, "return_onesided=True applies to real data only: the spectrum "
                                  "of complex data is not symmetric", function)
    return 1 if return_onesided else 0



# ---- batches -------------------------------------------------------------------------
# An N-D x is a batch of records, the 1-D slices along `axis`, fitted by the
# library's batch twin of the fit in one call: one status per record, the
# records spread over `workers` threads, each record's results those of the
# 1-D call on it, bit for bit.
_RECORD_FAILED = 20003


class _Records(NamedTuple):
    a: _np.ndarray   # count rows of n samples: row i at element i * distance
    c: bool
    shape: tuple     # the batch shape, x's shape without the axis
    n: int
    count: int
    distance: int


def _axis(axis, ndim, function):
    """axis as an index into x's dimensions; out of range is an ArgumentError naming it."""
    try:
        v = _op.index(axis)
    except TypeError:
        raise TypeError(f"{function}: axis must be an integer, not {axis!r}") from None
    if not -ndim <= v < ndim:
        raise ArgumentError(None, f"axis {v} is out of range for x of {ndim} dimension"
                                  f"{'s' if ndim > 1 else ''}", function)
    return v % ndim


def _input(x, axis, function):
    """x for a fit: (a, c, None) for one 1-D record, as `_signal` gives it, or
    (None, c, records) for a batch."""
    a = x if type(x) is _np.ndarray else _np.asarray(x)
    if a.ndim < 2:
        if axis != -1 and a.ndim == 1:
            _axis(axis, 1, function)
        a, c = _signal(a, function)
        return a, c, None
    dt = a.dtype
    if dt != _F64 and dt != _C128:
        if _np.can_cast(dt, _F64, "safe"):
            dt = _F64
        elif _np.can_cast(dt, _C128, "safe"):
            dt = _C128
        else:
            raise DTypeError(None, f"x of dtype {dt} has no lossless conversion to float64 or "
                                   "complex128", function)
    m = _np.moveaxis(a, _axis(axis, a.ndim, function), -1)
    shape, n = m.shape[:-1], m.shape[-1]
    if n > _INT32_MAX:
        raise ArgumentError(None, "x has more than 2^31 - 1 samples along axis", function)
    count = _math.prod(shape)
    r = m.reshape(count, n)  # a view wherever the rows have one stride
    if r.dtype != dt:
        r = r.astype(dt, order="C")
    size, (s0, s1) = r.itemsize, r.strides
    # Rows of contiguous samples one stride apart go in as they are, the stride
    # as the distance; anything else is copied into packed rows.
    if not (r.flags.aligned and (n < 2 or s1 == size)
            and (count < 2 or (s0 >= 0 and s0 % size == 0))):
        r = _np.ascontiguousarray(r)
        s0 = n * size
    return None, dt == _C128, _Records(r, dt == _C128, shape, n, count,
                                       s0 // size if count > 1 else n)


def _workers(workers, function):
    """The library's thread count for `workers`: None 1, a positive count
    itself, -1 every processor (0 to the library), -2 all but one, ..."""
    if workers is None:
        return 1
    try:
        w = _op.index(workers)
    except TypeError:
        raise TypeError(f"{function}: workers must be an integer or None, "
                        f"not {workers!r}") from None
    if w > 0:
        return min(w, _INT32_MAX)
    if w == -1:
        return 0
    if w < 0 and w + (_os.cpu_count() or 1) + 1 > 0:
        return w + (_os.cpu_count() or 1) + 1
    raise ArgumentError(None, f"workers {w} " + (
        "is not allowed: None or 1 runs one thread, -1 one per processor" if w == 0 else
        f"leaves no thread on {_os.cpu_count() or 1} processors"), function)


def _batch(name, r, args, outputs, threads, function, names=(), given=(), count=None):
    """The library's batch twin of `name` over the records r (the first
    `count` of them): the call's own status and the records' statuses. An
    error that concerns every record raises here, as the 1-D call raises it."""
    k = r.count if count is None else count
    status = _np.zeros(max(k, 1), _np.int32)
    s = _fn[name + "_batch", _kind(r.c)](_addr(r.a), r.n, k, r.distance, *args, *outputs,
                                        _addr(status), threads)
    if s != 0 and s != _RECORD_FAILED:
        _check(s, function, names, *given)
        raise NumericError(s, status_text(s), function)
    return status[:k]


def _warn_records(status, code, category, function, stacklevel=4):
    """One warning for the records whose status is `code` (a mask may stand for it)."""
    hit = status == code if not isinstance(code, _np.ndarray) else code
    k = int(_np.count_nonzero(hit))
    if k:
        first = int(status[_np.argmax(hit)]) if isinstance(code, _np.ndarray) else code
        _warnings.warn(category(first, f"{status_text(first)} ({k} of {status.size} records)",
                                function), stacklevel=stacklevel)


def _stack(r, array):
    """Packed rows as the batch's shape followed by the row's own."""
    return array[:r.count].reshape(r.shape + array.shape[1:])


def _fill_failed(status, *arrays):
    """NaN in every output row of a record that failed."""
    bad = status < 0
    if bad.any():
        for v in arrays:
            v[:status.size][bad] = _np.nan


def _batch_stderr(r, fs, flag, block, counts, status, function, threads):
    """The standard errors of the modes a Prony or pencil batch left in
    block[:, i, :counts[i]], by the mode errors' batch, as `_stderr` gives
    them record by record: NaN with one SingularBoundWarning where they
    cannot be made, and a record whose computation failed otherwise (no
    memory, LAPACK) takes that status."""
    k, room = r.count, block.shape[2]
    out = _np.full((4, max(k, 1), room), _np.nan)
    fitted = (status >= 0) & (counts > 0)
    if not fitted.any():
        return out[:, :k]
    nv = _np.empty(max(k, 1))
    es = _np.zeros(max(k, 1), _np.int32)
    args: tuple = (fs,) + (() if r.c else (flag,)) + (room, _addr(counts))
    s = _fn["mode_errors_batch", _kind(r.c)](
        _addr(r.a), r.n, k, r.distance, *args, *[_addr(block[q]) for q in range(4)],
        *[_addr(out[q]) for q in range(4)], _addr(nv), _addr(es), threads)
    es = es[:k]
    if s != 0 and s != _RECORD_FAILED:
        if not (-42499 <= s <= -42400 or s in _NO_BOUND):
            _check(s, function)
        es = _np.full(k, s, _np.int32)
    cannot = fitted & ((es == _BOUND_SINGULAR) | ((es <= -42400) & (es >= -42499))
                       | _np.isin(es, _NO_BOUND))
    _warn_records(es, cannot, SingularBoundWarning, function, stacklevel=5)
    broken = fitted & (es < 0) & ~cannot
    status[broken] = es[broken]
    out[:, :k][:, cannot & (es != _BOUND_SINGULAR)] = _np.nan
    return out[:, :k]


def _batch_modes(status, counts, fields, sort):
    """Mode rows of a batch as the 1-D calls give them: entries past a record's
    count (all of a failed record's) NaN, each record sorted by frequency
    (fields[3]) as `_order` sorts it. `fields` is a list of (count, room) arrays."""
    counts[status < 0] = 0
    room = fields[0].shape[1]
    pad = _np.arange(room) >= counts[:, None]
    for v in fields:
        v[pad] = _np.nan
    if not sort or room == 0:
        return fields
    # Padding sorts last; a record's own frequencies are finite.
    i = _np.argsort(_np.where(pad, _np.inf, fields[3]), axis=1, kind="stable")
    return [_np.take_along_axis(v, i, axis=1) for v in fields]


# ---- the fits ------------------------------------------------------------------------
def covariance(x: "ArrayLike", *, order: int, axis: int = -1,
               workers: Optional[int] = None) -> CovarianceFit:
    """Covariance-method AR model: forward linear prediction by least squares.

    Fits x[t] + a[1] x[t-1] + ... + a[p] x[t-p] = e[t] over the n - p
    samples that have p predecessors, minimising the sum of |e[t]|**2,
    without windowing, and finds the model's poles.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    order : int, 1 <= order <= floor(2n/3)
        The model order p.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    CovarianceFit
        Named tuple ``(coefficients, poles, noise_variance)``:
        coefficients a[0..p] with a[0] = 1 (float64 for real data, complex128
        for complex), the p complex poles, and the mean squared prediction
        error over the n - p equations (units of x squared).
        Then ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D (code None); x is empty (-42401); order out of range
        (-42412); a NaN or infinite sample (-42419); the fit would exceed the
        library's work-memory bound (-42420).
    TypeError
        order is not an integer.
    NonFiniteResultError
        A result would be NaN or infinite (-30001): a degenerate record.
    NumericError
        Another numeric failure (root finder, LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        The least-squares system was rank deficient (typically a noise-free
        record fitted with more poles than it has exponentials); the
        minimum-norm solution was used and the results are complete.

    See Also
    --------
    pcar : the principal-component AR model.
    covariance_psd : this model's power spectrum.

    Examples
    --------
    Two damped sinusoids need four poles:

    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
    ...      + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0))
    >>> fit = qdm.covariance(x, order=4)
    >>> print(fit.coefficients.round(4))
    [ 1.     -0.9961  0.9705 -0.9453  0.9418]
    >>> p = fit.poles[np.argsort(np.angle(fit.poles))]
    >>> print((np.angle(p) / (2 * np.pi)).round(6))    # cycles per sample
    [-0.3 -0.1  0.1  0.3]
    >>> print(np.log(np.abs(p)).round(6))                # damping per sample
    [-0.02 -0.01 -0.01 -0.02]
    >>> fit.noise_variance < 1e-20
    True
    """
    threads = _workers(workers, "covariance")
    a, c, r = _input(x, axis, "covariance")
    if r is not None:
        coef, poles, nv, status = _covariance_batch(r, order, threads, "covariance")
        _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, "covariance", 3)
        return CovarianceFit(_stack(r, coef), _stack(r, poles), _stack(r, nv), _stack(r, status))
    n, p = a.shape[0], _int(order, "order", "covariance")
    m = _room(p, n)
    coef: _Coefficients = _np.empty(m + 1, _C128) if c else _np.empty(m + 1, _F64)
    poles = _np.empty(max(m, 1), _C128)
    nv = _ct.c_double()
    status = _check(_fn["covariance", _kind(c)](_addr(a), n, p, _addr(coef), _addr(poles),
                                                _ct.byref(nv)), "covariance", _COVARIANCE, None,
                    order)
    return CovarianceFit(coef, poles[:m], nv.value, status)


def _covariance_batch(r, order, threads, function, names=_COVARIANCE, given=None, count=None):
    """The covariance fits of a batch: coefficients, poles and noise variances
    as packed rows (NaN for a failed record), and the statuses."""
    p = _int(order, "order", function)
    m, rows = _room(p, r.n), max(r.count, 1)
    coef = _np.empty((rows, m + 1), _C128 if r.c else _F64)
    poles = _np.empty((rows, max(m, 1)), _C128)
    nv = _np.empty(rows)
    status = _batch("covariance", r, (p,), (_addr(coef), _addr(poles), _addr(nv)), threads,
                    function, names, (None, order) if given is None else given, count)
    _fill_failed(status, coef, poles, nv)
    return coef[:r.count], poles[:r.count, :m], nv[:r.count], status


_SOLVERS = {"auto": 0, "dense": 1, "krylov": 2}


def _solver(solver, where):
    if not isinstance(solver, str) or solver not in _SOLVERS:
        raise ArgumentError(None, f"solver must be one of {sorted(_SOLVERS)}, not {solver!r}",
                            where)


def pcar(x: "ArrayLike", *, order: int, components: int,
         solver: Literal["auto", "dense", "krylov"] = "auto", axis: int = -1,
         workers: Optional[int] = None) -> PcarFit:
    """Principal-component AR model: prediction through a truncated pseudo-inverse.

    Fits the AR model of order p to the forward and the backward linear
    prediction equations together (the backward ones conjugated for complex
    data), a 2(n - p)-by-p system solved through its pseudo-inverse kept to
    the `components` strongest singular components, and finds its roots.
    Truncating to the signal's components removes most of the noise from
    the model.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    order : int, 1 <= order <= floor(2n/3)
        The model order p (0 passes the order check, but no `components`
        value is then valid).
    components : int, 1 <= components <= order
        Singular components kept, k: the number of complex exponentials the
        record holds (twice the number of real sinusoids).
    solver : {"auto", "dense", "krylov"}, default "auto"
        How the data matrix's leading singular triplets are found. "dense"
        forms the matrix and takes its SVD, O(n p**2). "krylov" takes the
        k + 1 leading triplets by Lanczos over FFT products with the record,
        without forming the matrix, O(n log n) per product: for long records
        at large orders. "auto" takes whichever is estimated to be faster.
        Both routes give the same coefficients to rounding wherever the kept
        components stand clear of the next.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    PcarFit
        Named tuple ``(coefficients, roots)``: a[0..p] with a[0] = 1
        (float64 for real data, complex128 for complex) and the p complex
        roots of the AR polynomial.
        Then ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, or solver is not one of the three names (code None);
        x is empty (-42401); order negative or above floor(2n/3) (-42411);
        components < 1 (-42412); components > order (-42413); a NaN or
        infinite sample (-42419); the fit would exceed the library's
        work-memory bound (-42420).
    TypeError
        order or components is not an integer.
    NonFiniteResultError
        A result would be NaN or infinite (-30001): a degenerate record.
    NumericError
        Another numeric failure: LAPACK, the root finder, extreme values, or
        the Krylov route not converging (-20070).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    See Also
    --------
    covariance : the AR model by plain least squares.
    pcar_psd : this model's spectrum and its strongest modes.

    Examples
    --------
    Two sinusoids, four exponentials, at an order well above four, kept to
    four components: four roots lie on the unit circle at the signal's
    frequencies, the other eight well inside it.

    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = np.cos(2 * np.pi * 0.1 * t + 0.5) + 0.5 * np.cos(2 * np.pi * 0.3 * t - 1.0)
    >>> fit = qdm.pcar(x, order=12, components=4)
    >>> print(fit.coefficients.shape, fit.roots.shape)
    (13,) (12,)
    >>> z = fit.roots[np.argsort(-np.abs(fit.roots))]      # nearest the unit circle first
    >>> print(np.abs(z[:4]).round(6), bool(np.abs(z[4:]).max() < 0.9))
    [1. 1. 1. 1.] True
    >>> print(np.sort(np.angle(z[:4]) / (2 * np.pi)).round(6))    # cycles per sample
    [-0.3 -0.1  0.1  0.3]
    """
    threads = _workers(workers, "pcar")
    a, c, r = _input(x, axis, "pcar")
    _solver(solver, "pcar")
    n = a.shape[0] if r is None else r.n
    p, k = _int(order, "order", "pcar"), _int(components, "components", "pcar")
    m = _room(p, n)
    if r is not None:
        rows = max(r.count, 1)
        coef = _np.empty((rows, m + 1), _C128 if c else _F64)
        roots = _np.empty((rows, max(m, 1)), _C128)
        status = _batch("pcar", r, (p, k, _SOLVERS[solver]), (_addr(coef), _addr(roots)),
                        threads, "pcar", _PCAR, (None, order, components))
        _fill_failed(status, coef, roots)
        _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, "pcar", 3)
        return PcarFit(_stack(r, coef), _stack(r, roots[:, :m]), _stack(r, status))
    coef: _Coefficients = _np.empty(m + 1, _C128) if c else _np.empty(m + 1, _F64)
    roots = _np.empty(max(m, 1), _C128)
    status = _check(_fn["pcar_solver", _kind(c)](_addr(a), n, p, k, _SOLVERS[solver],
                                                 _addr(coef), _addr(roots)), "pcar", _PCAR,
                    None, order, components)
    return PcarFit(coef, roots[:m], status)


def prony(x: "ArrayLike", *, order: int, fs: float = 1.0,
          real_signal: bool = False, sort: bool = True, axis: int = -1,
          workers: Optional[int] = None) -> PronyFit:
    """Damped exponentials by Prony's method.

    Fits x[t] = sum_i A_i z_i**t with p = `order` poles z_i, the roots of a
    covariance-method AR model of order p (see `covariance`), and the
    amplitudes A_i by a least-squares fit of those poles to the record.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    order : int, 1 <= order <= floor(2n/3)
        The number of exponentials p (a real sinusoid takes two).
    fs : float, fs > 0, default 1.0
        Sampling rate: `frequency` is in Hz and `damping_per_s` in 1/s when
        given, both per sample with the default.
    real_signal : bool, default False
        Real data only: report one mode per conjugate pair, the poles with
        arg(z) in [0, pi), amplitude that of the one exponential (not
        doubled). False reports every pole, as for complex data.
    sort : bool, default True
        Sort the modes by frequency, every field alike. False keeps the
        order of the poles, as the C API gives them.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    PronyFit
        Named tuple ``(amplitude, phase, damping, frequency, damping_per_s)``
        of float64 arrays, one value per mode, sorted by frequency: amplitude
        |A_i| (units of x), phase arg(A_i) in radians in (-pi, pi], damping
        ln|z_i| per sample (negative when decaying), frequency arg(z_i) fs /
        (2 pi) (Hz when fs is given, else cycles per sample), damping_per_s
        = damping * fs (1/s). p modes, or fewer with real_signal.
        Then the standard errors, ``mode_count`` and ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, or real_signal with complex data (code None); x is
        empty (-42401); order out of range (-42412); fs not positive
        (-42418); a NaN or infinite sample or fs (-42419); the fit would
        exceed the library's work-memory bound (-42420).
    TypeError
        order is not an integer.
    NonFiniteResultError
        A result would be NaN or infinite (-30001): a degenerate record
        (zeros, a spike, ...).
    NumericError
        Another numeric failure (root finder, LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        A least-squares system was rank deficient (order above the number
        of exponentials in a noise-free record); the results are complete.

    See Also
    --------
    matrix_pencil : the same model, far more robust to noise.

    Notes
    -----
    With as many poles as the record has exponentials, Prony's method is
    biased in noise; a larger order, keeping the strongest modes, or
    `matrix_pencil` does better.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
    ...      + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0))
    >>> fit = qdm.prony(x, order=4, fs=1000.0, real_signal=True)
    >>> print(fit.frequency.round(6))        # Hz, sorted
    [100. 300.]
    >>> print(fit.damping_per_s.round(6))    # 1/s; fit.damping is per sample
    [-10. -20.]
    >>> print(fit.amplitude.round(6), fit.phase.round(6))
    [0.5  0.25] [ 0.5 -1. ]
    """
    threads = _workers(workers, "prony")
    a, c, r = _input(x, axis, "prony")
    n = a.shape[0] if r is None else r.n
    p, rate = _int(order, "order", "prony"), _fs(fs, "prony")
    flag = _real_flag(real_signal, c, "prony")
    if r is not None:
        block, counts = _np.empty((4, max(r.count, 1), max(_room(p, n), 1))), \
            _np.zeros(max(r.count, 1), _np.int32)
        status = _batch("prony", r, (p, rate) + (() if c else (flag,)),
                        [_addr(block[q]) for q in range(4)] + [_addr(counts)], threads,
                        "prony", _PRONY, (None, order))
        fit = _batch_fits(r, rate, flag, block, counts, status, sort, "prony", threads)
        return PronyFit(*fit[:4], fit[2] * rate, *fit[4:8], fit[6] * rate, fit[8],
                        _stack(r, status))
    block, rows = _modes(4, _room(p, n))
    count = _ct.c_int32()
    args: tuple = (_addr(a), n, p, rate) + (() if c else (flag,))
    status = _check(_fn["prony", _kind(c)](*args, *rows, _ct.byref(count)), "prony", _PRONY,
                    None, order)
    amplitude, phase, damping, frequency = block[:, :count.value]
    sa, sp, sd, sf = _stderr(a, c, rate, flag, block, count.value, "prony")
    i = _order(frequency, sort)
    return PronyFit(amplitude[i], phase[i], damping[i], frequency[i], damping[i] * rate,
                    sa[i], sp[i], sd[i], sf[i], sd[i] * rate, count.value, status)


def matrix_pencil(x: "ArrayLike", *, modes: int, pencil: Optional[int] = None,
                  fs: float = 1.0, real_signal: bool = False,
                  solver: Literal["auto", "dense", "krylov"] = "auto",
                  sort: bool = True, axis: int = -1,
                  workers: Optional[int] = None) -> PencilFit:
    """Damped exponentials by the matrix pencil method.

    Fits x[t] = sum_i A_i z_i**t: the poles z_i are the eigenvalues of the
    pencil formed by the (n - L)-by-L Hankel data matrix of the record and
    its one-sample shift, both reduced to their `modes` strongest singular
    components (L = `pencil`); the amplitudes A_i come from a least-squares
    fit of the poles to the record.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    modes : int, 1 <= modes <= pencil
        The number of exponentials M (a real sinusoid takes two). Fewer come
        back when M > n - L: see Notes.
    pencil : int or None, modes <= pencil <= floor(2n/3), default None
        The pencil parameter L, the data matrix's column count. None takes
        n // 3, the usual choice (n/3 to n/2 is the low-variance range).
    fs : float, fs > 0, default 1.0
        Sampling rate: `frequency` is in Hz and `damping_per_s` in 1/s when
        given, both per sample with the default.
    real_signal : bool, default False
        Real data only: report one mode per conjugate pair, the poles with
        arg(z) in [0, pi), amplitude that of the one exponential (not
        doubled). False reports every pole, as for complex data.
    solver : {"auto", "dense", "krylov"}, default "auto"
        How the data matrix's leading singular triplets are found. "dense"
        forms and decomposes the matrix, O(n L**2). "krylov" takes the M
        leading triplets by Lanczos over FFT products with the record,
        without forming it, O(n log n) per product: for long records.
        "auto" takes the Krylov route for long records with M small beside
        L (at most L/4), the dense one otherwise. Both give the same modes
        to rounding wherever the M-th singular value stands clear of the next.
    sort : bool, default True
        Sort the modes by frequency, every field alike. False keeps the
        order of the poles, as the C API gives them.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    PencilFit
        Named tuple ``(amplitude, phase, damping, frequency, mse,
        damping_per_s)``. The mode arrays are float64, one value per mode,
        sorted by frequency: amplitude |A_i| (units of x), phase arg(A_i) in
        radians in (-pi, pi], damping ln|z_i| per sample (negative when
        decaying), frequency arg(z_i) fs / (2 pi) (Hz when fs is given, else
        cycles per sample), damping_per_s = damping * fs (1/s). mse is the
        mean squared error of the fitted modes against the record (units of
        x squared).
        Then the standard errors, ``mode_count`` and ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, real_signal with complex data, or solver not one of
        the three names (code None); x is empty (-42401); pencil negative or
        above floor(2n/3) (-42411); modes < 1 (-42412); modes > pencil
        (-42413); fs not positive (-42418); a NaN or infinite sample or fs
        (-42419); the fit would exceed the library's work-memory bound
        (-42420).
    TypeError
        modes or pencil is not an integer (or None for pencil).
    NonFiniteResultError
        A result would be NaN or infinite (-30001): a degenerate record.
    NumericError
        Another numeric failure: LAPACK, extreme values (-20068, e.g. an
        all-zero record), or the Krylov route not converging (-20070).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        The amplitude fit was rank deficient; the results are complete.

    See Also
    --------
    mdl_order : choose `modes` from the record.
    prony : the same model from an AR fit.

    Notes
    -----
    The number of modes returned is min(modes, n - L), the most the
    (n - L)-by-L matrix can give. modes above L is refused
    (ArgumentError, code -42413); modes between n - L and L, possible only
    when L > n/2, is not an error: n - L modes come back. With real_signal
    only the poles with arg(z) in [0, pi) of those are reported, about half.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
    ...      + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0))
    >>> fit = qdm.matrix_pencil(x, modes=4, fs=1000.0, real_signal=True)
    >>> print(fit.frequency.round(6))        # Hz, sorted
    [100. 300.]
    >>> print(fit.damping_per_s.round(6))    # 1/s
    [-10. -20.]
    >>> print(fit.damping.round(6))          # per sample
    [-0.01 -0.02]
    >>> print(fit.amplitude.round(6), fit.phase.round(6))
    [0.5  0.25] [ 0.5 -1. ]
    >>> fit.mse < 1e-20
    True

    With L = 40 above n/2, at most n - L = 24 modes; more than L is an error:

    >>> len(qdm.matrix_pencil(x, modes=30, pencil=40).frequency)
    24
    >>> qdm.matrix_pencil(x, modes=41, pencil=40)
    Traceback (most recent call last):
        ...
    qdm.ArgumentError: matrix_pencil: modes 41 is above pencil = 40
    """
    threads = _workers(workers, "matrix_pencil")
    a, c, r = _input(x, axis, "matrix_pencil")
    _solver(solver, "matrix_pencil")
    n = a.shape[0] if r is None else r.n
    L = _clib.qdm_default_pencil(n) if pencil is None else _int(pencil, "pencil", "matrix_pencil")
    M = _int(modes, "modes", "matrix_pencil")
    rate = _fs(fs, "matrix_pencil")
    flag = _real_flag(real_signal, c, "matrix_pencil")
    settings: tuple = (L, M, rate) + (() if c else (flag,)) + (_SOLVERS[solver],)
    if r is not None:
        rows = max(r.count, 1)
        block, counts = _np.empty((4, rows, max(_room(M, n), 1))), _np.zeros(rows, _np.int32)
        mse = _np.empty(rows)
        status = _batch("matrix_pencil", r, settings,
                        [_addr(block[q]) for q in range(4)] + [_addr(counts), _addr(mse)],
                        threads, "matrix_pencil", _PENCIL, (None, pencil, modes))
        fit = _batch_fits(r, rate, flag, block, counts, status, sort, "matrix_pencil", threads)
        _fill_failed(status, mse)
        return PencilFit(*fit[:4], _stack(r, mse), fit[2] * rate, *fit[4:8], fit[6] * rate,
                         fit[8], _stack(r, status))
    block, rows = _modes(4, _room(M, n))
    count, mse = _ct.c_int32(), _ct.c_double()
    status = _check(_fn["matrix_pencil_solver", _kind(c)](_addr(a), n, *settings, *rows,
                                                           _ct.byref(count), _ct.byref(mse)),
                    "matrix_pencil", _PENCIL, None, pencil, modes)
    amplitude, phase, damping, frequency = block[:, :count.value]
    sa, sp, sd, sf = _stderr(a, c, rate, flag, block, count.value, "matrix_pencil")
    i = _order(frequency, sort)
    return PencilFit(amplitude[i], phase[i], damping[i], frequency[i], mse.value,
                     damping[i] * rate, sa[i], sp[i], sd[i], sf[i], sd[i] * rate, count.value,
                     status)


def _batch_fits(r, rate, flag, block, counts, status, sort, function, threads):
    """A Prony or pencil batch's modes and their error bars, each record sorted
    as the 1-D call sorts it: amplitude, phase, damping, frequency, their four
    standard errors, all of the batch's shape followed by the room, and the
    mode counts. The status of a record whose error bars failed is updated."""
    k = r.count
    block, counts = block[:, :k], counts[:k]
    errors = _batch_stderr(r, rate, flag, block, counts, status, function, threads)
    fields = _batch_modes(status, counts, list(block) + list(errors), sort)
    _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, function, 4)
    return [_stack(r, v) for v in fields] + [_stack(r, counts)]


def mdl_order(x: "ArrayLike", *, pencil: Optional[int] = None, min_order: int = 1,
              max_order: Optional[int] = None, axis: int = -1,
              workers: Optional[int] = None) -> "Union[int, MdlOrder]":
    """Model order by the minimum description length of matrix-pencil fits.

    Scores each order m from `min_order` to r = min(n - L', L') by
    n ln(E_m) + 10 m ln(n), E_m the fitting error of the m-mode matrix
    pencil with pencil parameter L', and returns the order of the lowest
    score. L' is `pencil`, less one when it is exactly n/2.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    pencil : int or None, min_order < pencil <= floor(2n/3), default None
        The pencil parameter L of the scored fits; the largest order tried
        is min(n - L', L'). None takes the library's default, min(n // 3, 64)
        and at least 2, valid for every n >= 3 (below that no value fits):
        the cap keeps the O(n m + m**3) search small on long records.
    min_order : int, min_order >= 1, default 1
        The smallest order tried.
    max_order : int or None, default None
        The old name of `pencil`: still accepted, with a DeprecationWarning.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    int
        The chosen order: the number of complex exponentials (a real
        sinusoid counts two), usable as `modes` of `matrix_pencil`. 0 when no
        order scores below 10000. A fit with E below 2.2e-16 (a noise-free
        record) ends the search at once.
    MdlOrder
        For an N-D x: named tuple ``(order, status)`` of int32 arrays of the
        batch's shape, each record's order (0 when it failed) and status.

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D (code None); x is empty (-42401); min_order < 1
        (-42414); pencil not above min_order or above floor(2n/3)
        (-42415); both pencil and max_order given (code None); a NaN or
        infinite sample (-42419); the fits would exceed
        the library's work-memory bound (-42420).
    TypeError
        pencil or min_order is not an integer.
    NumericError
        A numeric failure in a fit (LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        A least-squares system in a fit was rank deficient.
    DeprecationWarning
        max_order was given (the old name of pencil).

    See Also
    --------
    matrix_pencil : the fit scored.

    Notes
    -----
    The record is scored at unit power (divided by its root mean square),
    so the fixed threshold 10000 and floor 2.2e-16 weigh the fitting error
    against the record's own power: x and c * x give the same order.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
    ...      + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0))
    >>> qdm.mdl_order(x)            # two real sinusoids: four exponentials
    4
    >>> qdm.mdl_order(x, pencil=20, min_order=2)
    4
    """
    threads = _workers(workers, "mdl_order")
    a, c, r = _input(x, axis, "mdl_order")
    n = a.shape[0] if r is None else r.n
    if max_order is not None:
        if pencil is not None:
            raise ArgumentError(None, "give pencil only (max_order is its old name)", "mdl_order")
        _warnings.warn("mdl_order: max_order= is the pencil parameter of the scored fits, now "
                       "called pencil=; the old name will be removed", DeprecationWarning,
                       stacklevel=2)
        pencil = max_order
    upper = (_clib.qdm_default_mdl_upper(n) if pencil is None
             else _int(pencil, "pencil", "mdl_order"))
    lower = _int(min_order, "min_order", "mdl_order")
    if r is not None:
        orders = _np.zeros(max(r.count, 1), _np.int32)
        status = _batch("mdl_order", r, (upper, lower), (_addr(orders),), threads, "mdl_order",
                        _MDL, (None, pencil, min_order))
        orders[:r.count][status < 0] = 0
        _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, "mdl_order", 3)
        return MdlOrder(_stack(r, orders), _stack(r, status))
    order = _ct.c_int32(0)
    _check(_fn["mdl_order", _kind(c)](_addr(a), n, upper, lower, _ct.byref(order)), "mdl_order",
           _MDL, None, pencil, min_order)
    return order.value


def covariance_psd(x: "ArrayLike", *, order: int, nfft: Optional[int] = None,
                   fs: float = 1.0, return_onesided: Optional[bool] = None,
                   points: Optional[int] = None, axis: int = -1,
                   workers: Optional[int] = None) -> CovarianceSpectrum:
    """Power spectral density of the covariance-method AR model.

    Fits the order-p model of `covariance` (coefficients A, noise variance
    sigma**2) and evaluates its density sigma**2 / fs / |A(f)|**2 at N
    frequencies, N the power of two not below `nfft`, and its shape in dB
    with the peak at exactly 0 dB. Real data gives the one-sided spectrum
    from 0 to fs/2, as scipy.signal.welch does.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    order : int, 1 <= order <= floor(2n/3), order + 1 <= N
        The model order p.
    nfft : int or None, 2 <= nfft <= 2**30, default None (512)
        Frequencies asked for over the full circle; N is the power of two
        not below it, and must be at least order + 1.
    fs : float, fs > 0, default 1.0
        Sampling rate: the axis is in Hz and the density per Hz when given,
        in cycles per sample with the default.
    return_onesided : bool or None, default None
        True: the N/2 + 1 frequencies 0 to fs/2, the density doubled at all
        but 0 and fs/2 (real data only); False: the N frequencies -fs/2 to
        fs/2 - fs/N. None: one-sided for real data, two-sided for complex.
    points : int or None, default None
        The old name of `nfft`: still accepted, with a DeprecationWarning.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    CovarianceSpectrum
        Named tuple ``(frequencies, psd, spectrum, noise_variance)``: the
        axis (Hz when fs is given, else cycles per sample), the density in
        units of x squared per Hz, the shape in dB (peak 0 dB), float64
        arrays of one length; and the model's prediction-error variance
        sigma**2 (units of x squared).
        Then ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, return_onesided=True with complex data, or both nfft
        and points given (code None); x is empty (-42401); order out of
        range (-42412); nfft below 2 or above 2**30 (-42417); fs not positive
        (-42418); a NaN or infinite sample or fs (-42419); the fit would
        exceed the library's work-memory bound (-42420); N below order + 1
        (-42422).
    TypeError
        order or nfft is not an integer.
    NonFiniteResultError
        A result would be NaN or infinite (-30001), e.g. a pole on the unit
        circle (a ramp) putting an infinity into the spectrum.
    NumericError
        Another numeric failure (root finder, LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        The least-squares system was rank deficient; the results are complete.
    DeprecationWarning
        `points` was given.

    See Also
    --------
    covariance : the model itself.
    pcar_psd : the principal-component AR spectrum.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> t = np.arange(64)
    >>> x = (np.exp(-0.01 * t) * np.cos(2 * np.pi * 0.1 * t + 0.5)
    ...      + 0.5 * np.exp(-0.02 * t) * np.cos(2 * np.pi * 0.3 * t - 1.0))
    >>> f, Pxx, db, noise, status = qdm.covariance_psd(x, order=4, nfft=1000, fs=1000.0)
    >>> print(len(f), f[0], f[1] - f[0], f[-1])    # N = 1024: 0 to fs/2 in steps of fs/N
    513 0.0 0.9765625 500.0
    >>> print(db.max(), f[np.argmax(Pxx)].round(1))    # the peak, in Hz
    0.0 99.6
    >>> s = qdm.covariance_psd(x, order=4, nfft=1000, fs=1000.0, return_onesided=False)
    >>> print(len(s.frequencies), s.frequencies[0])
    1024 -500.0
    """
    threads = _workers(workers, "covariance_psd")
    a, c, r = _input(x, axis, "covariance_psd")
    n = a.shape[0] if r is None else r.n
    p = _int(order, "order", "covariance_psd")
    pts = _nfft(nfft, points, "covariance_psd")
    rate = _fs(fs, "covariance_psd")
    given = (None, order, nfft if points is None else points)
    flag = _onesided(return_onesided, c, "covariance_psd")
    if r is not None:
        return _covariance_psd_batch(r, p, pts, rate, flag, given, threads)
    m = _room(p, n)
    coef: _Coefficients = _np.empty(m + 1, _C128) if c else _np.empty(m + 1, _F64)
    poles = _np.empty(max(m, 1), _C128)
    nv = _ct.c_double()
    status = _check(_fn["covariance", _kind(c)](_addr(a), n, p, _addr(coef), _addr(poles),
                                                _ct.byref(nv)), "covariance_psd", _SPECTRUM,
                    *given)
    psd = _fn["ar_psd", _kind(c)]
    # Null outputs: the sizes are checked before room for them is made.
    probe = psd(None, p, nv.value, pts, rate, flag, None, None, None, None)
    if probe != _NULL_POINTER:
        _check(probe, "covariance_psd", _SPECTRUM, *given)
    out = _np.empty((3, max(_clib.qdm_spectrum_length(pts), 1)))
    count = _ct.c_int32()
    _check(psd(_addr(coef), p, nv.value, pts, rate, flag, *(_addr(row) for row in out),
               _ct.byref(count)), "covariance_psd", _SPECTRUM, *given)
    f, db, psd = out[:, :count.value]
    return CovarianceSpectrum(f, psd, db, nv.value, status)


def _axis_of(N, rate, onesided, values=None):
    """The frequency axis of an N-value spectrum as the library lays it out,
    and (with `values`) those N values laid out the same way, in place: the
    layout only moves values, so a batch's rows follow the moves of 0..N-1."""
    values = _np.zeros(N) if values is None else values
    axis, length = _np.empty(N), _ct.c_int32()
    _check(_clib.qdm_spectrum_layout(_addr(values), None, N, rate, onesided, _addr(axis),
                                     _ct.byref(length)), "spectrum_layout")
    return axis[:length.value], values[:length.value]


def _covariance_psd_batch(r, p, pts, rate, flag, given, threads):
    """covariance_psd on a batch: the covariance batch, then each fitted
    record's spectrum by the same library call the 1-D path makes."""
    # The arguments in the 1-D call's order: the fit's first, then the spectrum's.
    _covariance_batch(r, p, threads, "covariance_psd", _SPECTRUM, given, count=0)
    psd = _fn["ar_psd", _kind(r.c)]
    probe = psd(None, p, 0.0, pts, rate, flag, None, None, None, None)
    if probe != _NULL_POINTER:
        _check(probe, "covariance_psd", _SPECTRUM, *given)
    coef, _, nv, status = _covariance_batch(r, p, threads, "covariance_psd", _SPECTRUM, given)
    N = _clib.qdm_spectrum_length(pts)
    db, density = _np.full((r.count, N), _np.nan), _np.full((r.count, N), _np.nan)
    scratch, count = _np.empty(N), _ct.c_int32()
    for i in _np.flatnonzero(status >= 0):
        s = psd(_addr(coef[i]), p, float(nv[i]), pts, rate, flag, _addr(scratch), _addr(db[i]),
                _addr(density[i]), _ct.byref(count))
        if s != 0:
            status[i] = s
    _fill_failed(status, db, density, nv)
    _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, "covariance_psd", 4)
    f, _ = _axis_of(N, rate, flag)
    return CovarianceSpectrum(f, _stack(r, density[:, :f.size]), _stack(r, db[:, :f.size]),
                              _stack(r, nv), _stack(r, status))


def pcar_psd(x: "ArrayLike", *, order: int, components: int, nfft: Optional[int] = None,
             fs: float = 1.0, real_signal: bool = False, return_onesided: Optional[bool] = None,
             sort: bool = True, points: Optional[int] = None, axis: int = -1,
             workers: Optional[int] = None) -> PcarSpectrum:
    """Power spectrum of the principal-component AR model, and its strongest modes.

    Evaluates 1/|A(f)|**2 of the model `pcar` fits at N frequencies, N the
    power of two not below `nfft`, in dB with its peak at exactly 0 dB
    (one-sided, 0 to fs/2, for real data); and takes the `components` roots
    nearest the unit circle as modes, their amplitudes fitted to the record
    by least squares.

    Parameters
    ----------
    x : array_like, n >= 1 samples along axis
        The record, or for N-D x a batch of records along `axis`. float64
        runs the real fit, complex128 the complex one; other dtypes numpy
        casts safely to one of them are converted.
    order : int, 1 <= order <= floor(2n/3), order + 1 <= N
        The model order p (0 passes the order check, but no `components`
        value is then valid).
    components : int, 1 <= components <= order
        Singular components kept, and the number of modes k reported.
    nfft : int or None, 2 <= nfft <= 2**30, default None (512)
        Frequencies asked for over the full circle; N is the power of two
        not below it, and must be at least order + 1.
    fs : float, fs > 0, default 1.0
        Sampling rate: the axis and `frequency` are in Hz when given, in
        cycles per sample with the default.
    real_signal : bool, default False
        Real data only: of the k modes report those with arg(z) in [0, pi),
        one per conjugate pair. False reports all k, as for complex data.
    return_onesided : bool or None, default None
        True: the N/2 + 1 frequencies 0 to fs/2 (real data only); False: the
        N frequencies -fs/2 to fs/2 - fs/N. None: one-sided for real data,
        two-sided for complex.
    sort : bool, default True
        Sort the modes by frequency, every field alike. False keeps the
        library's order, nearest the unit circle first.
    points : int or None, default None
        The old name of `nfft`: still accepted, with a DeprecationWarning.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    PcarSpectrum
        Named tuple ``(frequencies, spectrum, amplitude, phase, frequency,
        fit_error)``: the axis and the spectrum in dB (peak 0 dB), float64
        of one length; the modes sorted by frequency, amplitude |A_i| (units
        of x), phase in radians in (-pi, pi], frequency in Hz when fs is
        given, else cycles per sample; and the amplitude fit's mean squared
        error (units of x squared). No damping, no density.
        Then ``mode_count`` and ``status``: 0, or 20001 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, real_signal or return_onesided=True with complex data,
        or both nfft and points given (code None); x is empty (-42401);
        order negative or above floor(2n/3) (-42411); components < 1
        (-42412); components > order (-42413); nfft below 2 or above 2**30
        (-42417); fs not positive (-42418); a NaN or infinite sample or fs
        (-42419); the fit would exceed the library's work-memory bound
        (-42420); N below order + 1 (-42422).
    TypeError
        order, components or nfft is not an integer.
    NonFiniteResultError
        A result would be NaN or infinite (-30001): a degenerate record.
    NumericError
        Another numeric failure (root finder, LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        The amplitude fit was rank deficient; the results are complete.
    DeprecationWarning
        `points` was given.

    See Also
    --------
    pcar : the model itself.
    covariance_psd : the covariance AR spectrum, with a density.

    Examples
    --------
    Two sinusoids at 100 and 300 Hz, amplitudes 1 and 0.5 (each the sum of
    two exponentials of half that amplitude):

    >>> import numpy as np, qdm
    >>> t = np.arange(64) / 1000.0
    >>> x = np.cos(2 * np.pi * 100 * t + 0.5) + 0.5 * np.cos(2 * np.pi * 300 * t - 1.0)
    >>> s = qdm.pcar_psd(x, order=12, components=4, fs=1000.0, real_signal=True)
    >>> print(len(s.frequencies), s.frequencies[-1], s.spectrum.max())
    257 500.0 0.0
    >>> print(s.frequency.round(3), s.amplitude.round(3), s.phase.round(3))
    [100. 300.] [0.5  0.25] [ 0.5 -1. ]
    """
    threads = _workers(workers, "pcar_psd")
    a, c, r = _input(x, axis, "pcar_psd")
    n = a.shape[0] if r is None else r.n
    p = _int(order, "order", "pcar_psd")
    k = _int(components, "components", "pcar_psd")
    pts = _nfft(nfft, points, "pcar_psd")
    onesided = _onesided(return_onesided, c, "pcar_psd")
    N = _clib.qdm_spectrum_length(pts)
    rate = _fs(fs, "pcar_psd")
    flag = _real_flag(real_signal, c, "pcar_psd")
    settings: tuple = (p, pts, k, rate) + (() if c else (flag,))
    given = (None, order, nfft if points is None else points, components)
    if r is not None:
        rows = max(r.count, 1)
        block, counts = _np.empty((3, rows, max(_room(k, n), 1))), _np.zeros(rows, _np.int32)
        db, f0, df, err = _np.empty((rows, max(N, 1))), *_np.empty((3, rows))
        status = _batch("pcar_psd", r, settings, [_addr(block[q]) for q in range(3)]
                        + [_addr(counts), _addr(db), _addr(f0), _addr(df), _addr(err)],
                        threads, "pcar_psd", _SPECTRUM, given)
        _fill_failed(status, db, err)
        _warn_records(status, _RANK_DEFICIENT, RankDeficientWarning, "pcar_psd", 3)
        db, counts = db[:r.count], counts[:r.count]
        f, moved = _axis_of(N, rate, onesided, _np.arange(N, dtype=_np.float64))
        amplitude, phase, frequency = _batch_modes(status, counts, [block[0, :r.count],
                                                   block[1, :r.count], block[2, :r.count],
                                                   block[2, :r.count]], sort)[:3]
        return PcarSpectrum(f, _stack(r, db[:, moved.astype(_np.intp)]), _stack(r, amplitude),
                            _stack(r, phase), _stack(r, frequency), _stack(r, err),
                            _stack(r, counts), _stack(r, status))
    db = _np.empty(max(N, 1))
    block, rows = _modes(3, _room(k, n))
    count = _ct.c_int32()
    f0, df, err = _ct.c_double(), _ct.c_double(), _ct.c_double()
    args: tuple = (_addr(a), n) + settings
    status = _check(_fn["pcar_psd", _kind(c)](*args, *rows, _ct.byref(count), _addr(db),
                                              _ct.byref(f0), _ct.byref(df), _ct.byref(err)),
                    "pcar_psd", _SPECTRUM, *given)
    amplitude, phase, frequency = block[:, :count.value]
    axis, length = _np.empty(N), _ct.c_int32()
    _check(_clib.qdm_spectrum_layout(_addr(db), None, N, rate, onesided, _addr(axis),
                                     _ct.byref(length)), "pcar_psd")
    i = _order(frequency, sort)
    return PcarSpectrum(axis[:length.value], db[:length.value], amplitude[i], phase[i],
                        frequency[i], err.value, count.value, status)


def mode_errors(x: "ArrayLike", modes: "Union[PronyFit, PencilFit, Sequence[ArrayLike]]", *,
                fs: float = 1.0, real_signal: bool = False, axis: int = -1,
                workers: Optional[int] = None) -> ModeErrors:
    """Standard errors of exponential modes: the Cramer-Rao bound at the modes.

    For the model of `prony` and `matrix_pencil`, evaluates the Jacobian D
    of the modelled record with respect to every mode's amplitude, phase,
    damping and frequency at the modes given, estimates the noise variance
    s2 from their residual against x, and returns the square roots of the
    diagonal of the bound. Complex data (complex white noise): the bound
    (s2/2) [Re(D^H D)]**-1, s2 = ||x - model||**2 / (n - 2M) per complex
    sample. Real data (real white noise): s2 (D^T D)**-1, s2 =
    ||x - model||**2 / (n - P), each mode a real cosine
    2 a e**(damping t) cos(2 pi f t / fs + phase) with four parameters, a
    mode at 0 Hz (or fs/2) the real term a cos(phase) e**(damping t) with
    two (its phase and frequency errors are 0).

    Parameters
    ----------
    x : array_like, n samples along axis
        The record the modes describe: float64 for real data, complex128
        for complex data (other dtypes as for the fits).
    modes : PronyFit, PencilFit or a sequence of four arrays
        The modes: any object with ``amplitude``, ``phase``, ``damping`` and
        ``frequency`` fields (a fit's result, sorted or not), or the four
        arrays ``(amplitude, phase, damping, frequency)`` of equal length M,
        in the units the fits report (frequency in the units of fs).
    fs : float, fs > 0, default 1.0
        Sampling rate of the frequencies: that of the fit.
    real_signal : bool, default False
        Real data only: the modes are one per conjugate pair, as a fit with
        real_signal=True reports them. False (real data): every pole of the
        real record, each off 0 and fs/2 with its conjugate partner.
    axis : int, default -1
        The axis of x along which the samples of a record run, for an N-D x:
        each 1-D slice along it is a record, fitted by one library call for
        the whole batch (see "Batches" above).
    workers : int or None, default None
        Threads a batch's records are fitted on: None one, a positive count
        that many, -1 one per processor (-2 all but one, ...); 0 is an
        ArgumentError. The results are the same for every count.

    Returns
    -------
    ModeErrors
        Named tuple ``(amplitude_stderr, phase_stderr, damping_stderr,
        frequency_stderr, damping_per_s_stderr, noise_variance)``, the
        arrays in the order of the modes given.
        Then ``status``: 0, or 20002 for the warning. For an N-D x a batch:
        every field but a spectrum's axis gains the batch's shape in front,
        and status holds each record's status (see the result's class).

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D, the mode arrays differ in length or are not 1-D, or
        real_signal with complex data (code None); x is empty (-42401); no
        modes (-42416); fs not positive (-42418); a NaN or infinite sample
        or fs (-42419); a NaN or infinite mode value, or (real data,
        real_signal False) a mode without its conjugate partner (-42425);
        n not above the real parameters (real data) or 2M (complex data)
        (-42424).
    NumericError
        The model overflows, as a growing mode over a long record can
        (-20068); a LAPACK failure; `NonFiniteResultError` (-30001) for an
        error beyond the float64 range.
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    SingularBoundWarning
        The bound is singular or badly conditioned for some modes (the
        column-scaled Jacobian's singular values below 1e-7 of the largest
        carry them): their errors are NaN.

    Notes
    -----
    The bound is what an efficient, unbiased estimate achieves at high SNR.
    Below a method's threshold SNR, or for a biased fit (Prony's method with
    as many poles as modes in noise), the actual error is larger.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> rng = np.random.default_rng(0)
    >>> t = np.arange(256)
    >>> x = np.exp((-0.01 + 0.4j) * t) + 0.01 * (rng.standard_normal(256)
    ...                                           + 1j * rng.standard_normal(256))
    >>> fit = qdm.matrix_pencil(x, modes=1)
    >>> e = qdm.mode_errors(x, fit)
    >>> bool(np.allclose(e.frequency_stderr, fit.frequency_stderr))
    True
    >>> print(f"{e.noise_variance:.1e}")
    2.0e-04
    """
    threads = _workers(workers, "mode_errors")
    a, c, r = _input(x, axis, "mode_errors")
    if all(hasattr(modes, f) for f in ("amplitude", "phase", "damping", "frequency")):
        fields = (modes.amplitude, modes.phase, modes.damping, modes.frequency)
    else:
        fields = tuple(modes)
        if len(fields) != 4:
            raise ArgumentError(None, "modes must be a fit result or four arrays (amplitude, "
                                      "phase, damping, frequency)", "mode_errors")
    block = _np.array([_np.asarray(v, dtype=_np.float64) for v in fields]) \
        if len({_np.shape(v) for v in fields}) == 1 else None
    if r is not None:
        if block is None or block.shape[1:-1] != r.shape:
            raise ArgumentError(None, "the four mode arrays must be of one shape: x's batch "
                                      f"shape {r.shape} followed by the modes", "mode_errors")
        return _mode_errors_batch(r, block, _fs(fs, "mode_errors"),
                                  _real_flag(real_signal, c, "mode_errors"), threads)
    if block is None or block.ndim != 2:
        raise ArgumentError(None, "the four mode arrays must be 1-D and of one length",
                            "mode_errors")
    block = _np.ascontiguousarray(block)
    rate = _fs(fs, "mode_errors")
    flag = _real_flag(real_signal, c, "mode_errors")
    status, out, variance = _errors_call(a, c, rate, flag, [block[q].ctypes.data for q in range(4)],
                                         _int(block.shape[1], "modes", "mode_errors"))
    status = _check(status, "mode_errors")
    sa, sp, sd, sf = out
    return ModeErrors(sa, sp, sd, sf, sd * rate, variance, status)


def _mode_errors_batch(r, block, rate, flag, threads):
    """mode_errors on a batch. Record i's modes are the entries of its rows up
    to the last that is not NaN in all four arrays (a batch fit pads its rows
    with NaN); a record's failure is its status, its errors NaN."""
    room = block.shape[-1]
    rows = max(r.count, 1)
    modes = _np.zeros((4, rows, room))
    modes[:, :r.count] = block.reshape(4, r.count, room)
    given = ~_np.isnan(modes[:, :r.count]).all(axis=0)
    counts = _np.zeros(rows, _np.int32)
    counts[:r.count] = _np.where(given.any(axis=1), room - _np.argmax(given[:, ::-1], axis=1), 0)
    out, nv = _np.empty((4, rows, max(room, 1))), _np.empty(rows)
    status = _batch("mode_errors", r, (rate,) + (() if r.c else (flag,))
                    + (_int(room, "modes", "mode_errors"), _addr(counts)),
                    [_addr(modes[q]) for q in range(4)] + [_addr(out[q]) for q in range(4)]
                    + [_addr(nv)], threads, "mode_errors")
    out = out[:, :r.count, :room]
    out[:, _np.arange(room) >= counts[:r.count, None]] = _np.nan
    _fill_failed(status, *out, nv)
    _warn_records(status, _BOUND_SINGULAR, SingularBoundWarning, "mode_errors", 4)
    sa, sp, sd, sf = (_stack(r, v) for v in out)
    return ModeErrors(sa, sp, sd, sf, sd * rate, _stack(r, nv), _stack(r, status))


class Stabilization(NamedTuple):
    """A stabilization diagram, as `stabilization` returns it.

    One row per pole: the i-th value of every array field belongs to the same
    pole. Rows run order by order from min_order up, each order's poles
    sorted by frequency.

    Attributes
    ----------
    order : ndarray
        int32: the model order m of the fit the pole comes from.
    frequency : ndarray
        arg(z) fs / (2 pi): Hz when fs is given, else cycles per sample.
    damping : ndarray
        ln|z| per sample, negative for a decaying mode.
    amplitude : ndarray
        |A| of the pole's mode in the order-m least-squares fit, in the
        units of x.
    stable : ndarray
        bool: one pole of order m - 1 lies within both tolerances.
    stable_frequency : ndarray
        bool: some pole of order m - 1 lies within the frequency tolerance.
    stable_damping : ndarray
        bool: some pole of order m - 1 lies within the damping tolerance.
    mdl_order : int
        The order ``mdl_order(x, pencil=max_order, min_order=min_order)``
        chooses for the same record (0 when none scores below 10000).
    """
    order: NDArray[_np.int32]
    frequency: NDArray[_np.float64]
    damping: NDArray[_np.float64]
    amplitude: NDArray[_np.float64]
    stable: NDArray[_np.bool_]
    stable_frequency: NDArray[_np.bool_]
    stable_damping: NDArray[_np.bool_]
    mdl_order: int


def stabilization(x: "ArrayLike", *, max_order: int, min_order: int = 1,
                  pencil: Optional[int] = None, fs: float = 1.0, real_signal: bool = False,
                  freq_tol: float = 0.01, damping_tol: float = 0.05) -> Stabilization:
    """Matrix-pencil poles across model orders, the stable ones marked.

    Fits the matrix pencil with every order m from `min_order` to
    `max_order`, all from one decomposition of the record (the poles of
    order m are those of ``matrix_pencil(x, modes=m, pencil=L)``), and marks
    each pole of order m that a pole of order m - 1 matches: in frequency
    when |f - f'| <= freq_tol * max(|f|, fs / n), in damping when
    |d - d'| <= damping_tol * max(|d|, 1 / n). Physical modes stand in
    columns across the orders; noise poles wander.

    Parameters
    ----------
    x : array_like, 1-D, n >= 1 samples
        The record: one only. The diagram has no batch form (its row count
        differs from record to record); loop over records to fit several.
        float64 runs the real fit, complex128 the complex one; other dtypes
        numpy casts safely to one of them are converted.
    max_order : int, min_order < max_order <= min(pencil, n - pencil)
        The highest order fitted.
    min_order : int, min_order >= 1, default 1
        The lowest order listed. Its poles are compared with those of
        order min_order - 1 (none for order 1).
    pencil : int or None, 1 <= pencil <= floor(2n/3), default None
        The pencil parameter L. None takes max(n // 3, max_order), or n // 2
        for a max_order above that.
    fs : float, fs > 0, default 1.0
        Sampling rate: frequencies in Hz when given.
    real_signal : bool, default False
        Real data only: one pole per conjugate pair (arg(z) in [0, pi)).
    freq_tol : float, >= 0, default 0.01
        Frequency tolerance, relative to max(|f|, fs / n): the floor fs/n,
        the record's frequency resolution, keeps it from vanishing at 0 Hz.
    damping_tol : float, >= 0, default 0.05
        Damping tolerance, relative to max(|d|, 1 / n): the floor 1/n (one
        e-fold over the record) keeps it from vanishing for undamped modes.

    Returns
    -------
    Stabilization
        Named tuple ``(order, frequency, damping, amplitude, stable,
        stable_frequency, stable_damping, mdl_order)``: one row per pole,
        order by order, each order sorted by frequency, and the MDL order.

    Raises
    ------
    DTypeError
        x has a dtype with no lossless conversion to float64 or complex128.
    ArgumentError
        x is not 1-D or real_signal with complex data (code None); x is
        empty (-42401); pencil below 1 or above floor(2n/3) (-42411);
        min_order < 1 (-42414); max_order not above min_order or above
        min(pencil, n - pencil) (-42415); fs not positive (-42418); a
        negative tolerance (-42426); a NaN or infinite sample, fs or
        tolerance (-42419); the fits would exceed the library's work-memory
        bound (-42420).
    TypeError
        max_order, min_order or pencil is not an integer.
    NonFiniteResultError
        A pole or amplitude would be NaN or infinite (-30001): a degenerate
        record, such as a single spike (a pole at 0).
    NumericError
        Another numeric failure (LAPACK, extreme values).
    OutOfMemoryError
        The library could not allocate its work memory (-20001).

    Warns
    -----
    RankDeficientWarning
        A least-squares system in a fit was rank deficient.

    See Also
    --------
    matrix_pencil : the fit of one order.
    mdl_order : one order by the minimum description length.

    Examples
    --------
    >>> import numpy as np, qdm
    >>> t = np.arange(128)
    >>> x = (np.exp((-0.01 + 0.2j * np.pi) * t)
    ...      + 0.7 * np.exp((-0.02 + 0.6j * np.pi) * t)
    ...      + 0.5 * np.exp((-0.005 - 0.5j * np.pi) * t))
    >>> d = qdm.stabilization(x + 1e-3 * np.cos(0.9 * t ** 1.5), max_order=8)
    >>> d.mdl_order
    3
    >>> top = d.order == 8                   # rows of one order, by frequency
    >>> print(d.frequency[top].round(3))
    [-0.329 -0.25  -0.142 -0.093  0.1    0.141  0.207  0.3  ]
    >>> print(d.stable[top])
    [False  True False False  True False False  True]
    >>> print(d.amplitude[top & d.stable].round(2))
    [0.5 1.  0.7]
    """
    a, c = _signal(x, "stabilization")
    n = a.shape[0]
    upper = _int(max_order, "max_order", "stabilization")
    lower = _int(min_order, "min_order", "stabilization")
    L = max(n // 3, min(upper, n // 2)) if pencil is None else _int(pencil, "pencil",
                                                                    "stabilization")
    # An order above n/2 is refused before the table is touched: no room for it.
    room = max(int(_clib.qdm_stabilization_rows(lower, min(upper, n // 2))), 1)
    table = _np.zeros((3, room))
    ints = _np.zeros((2, room), dtype=_np.int32)
    rows, mdl = _ct.c_int64(), _ct.c_int32()
    ff = _fs(fs, "stabilization")
    args: tuple = (_addr(a), n, L, lower, upper, ff)
    if not c:
        args += (_real_flag(real_signal, c, "stabilization"),)
    else:
        _real_flag(real_signal, c, "stabilization")
    args += (_tolerance(freq_tol, "freq_tol"), _tolerance(damping_tol, "damping_tol"), room,
             _addr(ints[0]), _addr(table[0]), _addr(table[1]), _addr(table[2]), _addr(ints[1]),
             _ct.byref(rows), _ct.byref(mdl))
    _check(_fn["stabilization", _kind(c)](*args), "stabilization", _STABILIZATION, None,
           pencil, min_order, max_order)
    k = rows.value
    order, flags = ints[0, :k], ints[1, :k]
    frequency, damping, amplitude = table[:, :k]
    i = _np.lexsort((frequency, order))
    flags = flags[i]
    return Stabilization(order[i], frequency[i], damping[i], amplitude[i], (flags & 4) != 0,
                         (flags & 1) != 0, (flags & 2) != 0, mdl.value)


def _tolerance(v, name):
    """A tolerance as a float; anything float() refuses is a TypeError naming it."""
    if not isinstance(v, (str, bytes)):
        try:
            return float(v)
        except (TypeError, ValueError):
            pass
    raise TypeError(f"stabilization: {name} must be a real number, not {v!r}")
