"""qdm's fits over dask arrays: one record per 1-D slice, the blocks fitted where Dask runs them.

Fits
----
covariance, pcar, prony, matrix_pencil, mdl_order, covariance_psd, pcar_psd

Each takes a dask array ``x``, the keywords of the qdm fit of the same name
and ``axis=-1`` (the samples' axis), and returns that fit's named tuple with
a dask array in every field: the batch shape (x's shape without `axis`) in
front, each record's values behind it, as the qdm fit gives them for an N-D
numpy array (mode fields padded with NaN past a record's mode count, a
per-record ``status``; `mdl_order` gives ``(order, status)``). A record that
fails (a NaN sample, an all-zero record) gets its status and NaN outputs; the
other records complete. A chunk with a rank-deficient record (status 20001)
gives a `qdm.RankDeficientWarning` where it runs. Spectra share one
``frequencies`` axis.

Nothing is fitted until the result is computed. The samples' axis is
rechunked to one chunk; the other axes keep their chunks, and each chunk of
records is one task, fitted by one qdm batch call with ``workers=1``: Dask
supplies the parallelism (its threads, or processes on a
``distributed.Client``). The library's BLAS runs one thread per worker
thread: the library carries its own single-threaded OpenBLAS, so neither
numpy's thread setting nor Dask's reaches it, and a worker with k threads
uses k cores. Results are bit-identical to the serial in-process call on any
scheduler and any chunking of the records.

The arguments are checked when the graph is built, by fitting one made-up
record of the same length and dtype, so a bad order raises at once rather
than inside a task; that fit also gives the shared frequency axis of the
spectra. The output sizes and dtypes are declared to Dask from it, so
building the graph computes nothing of ``x``.

On a cluster, every worker must import qdm and load its library: install the
package on the workers, or pass ``QDM_LIBRARY`` and ``PYTHONPATH`` in their
environment.

Examples
--------
>>> import numpy as np, dask.array as da, qdm.dask as qd
>>> t = np.arange(256)
>>> x = da.from_array(np.cos(2 * np.pi * np.linspace(0.1, 0.2, 6)[:, None] * t), chunks=(2, 256))
>>> fit = qd.matrix_pencil(x, modes=2)
>>> fit.frequency.shape, fit.frequency.chunks[0], fit.status.dtype
((6, 2), (2, 2, 2), dtype('int32'))
>>> np.round(fit.frequency.compute()[:, 1], 3)
array([0.1 , 0.12, 0.14, 0.16, 0.18, 0.2 ])
"""
import inspect as _inspect
import warnings as _warnings

try:
    import dask.array as _da
except ImportError as _e:  # pragma: no cover - depends on the machine
    raise ImportError("qdm.dask needs dask: install python3-dask (Debian) or "
                      "`pip install dask`, and python3-distributed for a cluster") from _e
import numpy as _np

import qdm as _qdm

__all__ = ["covariance", "pcar", "prony", "matrix_pencil", "mdl_order", "covariance_psd",
           "pcar_psd"]

# Fields that hold one array for the whole batch rather than one row per record.
_SHARED = ("frequencies",)


def _probe_record(n, dtype):
    """A made-up record of n samples in x's dtype: seeded noise, so every fit's
    argument checks see an ordinary record of the given length."""
    rng = _np.random.default_rng(12345)
    noise = rng.standard_normal(n) * 100.0
    if _np.dtype(dtype).kind == "c":
        noise = noise + 1j * rng.standard_normal(n) * 100.0
    with _warnings.catch_warnings():
        _warnings.simplefilter("ignore")  # a cast to an integer or bool dtype is on purpose
        return noise.astype(dtype)


def _records(block, fit_name, kwargs):
    """The block function: fits every record of a block (samples on the last
    axis) in one qdm call on one thread, and returns the per-record fields.
    The fit goes into the graph by name, so a task pickles to a few bytes and
    each worker calls its own qdm."""
    fit = getattr(_qdm, fit_name)
    one = block.ndim == 1
    # A rank-deficient record warns here as in the batch call; it is not
    # silenced, since warnings.catch_warnings is not safe in Dask's threads.
    result = fit(block[None] if one else block, axis=-1, workers=1, **kwargs)
    fields = [_np.asarray(v) for k, v in zip(result._fields, result) if k not in _SHARED]
    return tuple(v[0] for v in fields) if one else tuple(fields)


def _over(fit, x, axis, kwargs):
    x = _da.asarray(x)
    if x.ndim == 0:
        raise _qdm.ArgumentError(None, "x must have at least one axis", fit.__name__)
    if not -x.ndim <= axis < x.ndim:
        raise _np.AxisError(axis, x.ndim)
    x = _da.moveaxis(x, axis, -1)
    n = x.shape[-1]
    if not isinstance(n, int) and _np.isnan(n):
        raise _qdm.ArgumentError(None, "the length of the samples' axis is unknown "
                                 "(compute_chunk_sizes() first)", fit.__name__)
    with _warnings.catch_warnings():
        _warnings.simplefilter("ignore")  # only argument errors matter here
        probe = fit(_probe_record(n, x.dtype)[None], axis=-1, workers=1, **kwargs)
    names = [k for k in probe._fields if k not in _SHARED]
    cores = [_np.shape(getattr(probe, k))[1:] for k in names]
    metas = tuple(_np.empty((0,) * (x.ndim - 1 + len(c)), _np.asarray(getattr(probe, k)).dtype)
                  for k, c in zip(names, cores))
    dims = [",".join(f"{k}{j}" for j in range(len(c))) for k, c in zip(names, cores)]
    sizes = {f"{k}{j}": s for k, c in zip(names, cores) for j, s in enumerate(c)}
    signature = "(qdm_samples)->" + ",".join(f"({d})" for d in dims)
    x = x.rechunk({x.ndim - 1: -1})
    out = _da.apply_gufunc(_records, signature, x, fit_name=fit.__name__, kwargs=kwargs, meta=metas,
                           output_sizes=sizes, vectorize=False)
    if len(names) == 1:
        out = (out,)
    made = dict(zip(names, out))
    for k in probe._fields:
        if k in _SHARED:
            made[k] = _da.from_array(_np.asarray(getattr(probe, k)), chunks=-1)
    return type(probe)(**made)


def _make(fit):
    def over(x, *, axis=-1, **kwargs):
        return _over(fit, x, axis, kwargs)

    over.__name__ = over.__qualname__ = fit.__name__
    over.__module__ = __name__
    params = [p for p in _inspect.signature(fit).parameters.values()
              if p.name not in ("x", "axis", "workers")]
    over.__signature__ = _inspect.Signature(
        [_inspect.Parameter("x", _inspect.Parameter.POSITIONAL_OR_KEYWORD,
                            annotation="dask.array.Array"),
         _inspect.Parameter("axis", _inspect.Parameter.KEYWORD_ONLY, default=-1,
                            annotation=int)] + params)
    over.__doc__ = (
        f"`qdm.{fit.__name__}` of every 1-D slice of a dask array along `axis`.\n\n"
        f"Lazy: returns the named tuple of `qdm.{fit.__name__}` on an N-D input, every\n"
        "field a dask array with the batch shape (x's shape without `axis`) in front;\n"
        "the records' chunks are fitted by one qdm call each with workers=1, the\n"
        "library's BLAS on one thread per Dask worker thread.\n\n"
        "Parameters\n----------\n"
        "x : dask.array.Array (or array_like), samples along `axis`\n"
        "    The records; its dtype picks the real or complex fit as in qdm.\n"
        "axis : int, default -1\n"
        "    The samples' axis; rechunked to one chunk.\n"
        f"**kwargs\n    The keywords of `qdm.{fit.__name__}`, checked at once.\n\n"
        "Returns\n-------\n"
        f"The result type of `qdm.{fit.__name__}`, every field a dask array.\n\n"
        "Raises\n------\n"
        f"qdm.ArgumentError, qdm.DTypeError, TypeError\n"
        "    Bad keywords or dtype, when the graph is built; a failing record is a\n"
        "    status in the result, not an exception.\n")
    return over


covariance = _make(_qdm.covariance)
pcar = _make(_qdm.pcar)
prony = _make(_qdm.prony)
matrix_pencil = _make(_qdm.matrix_pencil)
mdl_order = _make(_qdm.mdl_order)
covariance_psd = _make(_qdm.covariance_psd)
pcar_psd = _make(_qdm.pcar_psd)
