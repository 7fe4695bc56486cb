"""qdm.dask: every fit over a dask array equals the in-process qdm call on the
same records bit for bit, statuses included, on the threaded scheduler, with
any chunking, and on a local cluster of two worker processes; building the
graph reads nothing of x."""
import doctest
import faulthandler
import os
import subprocess
import sys
import time

import numpy as np
import pytest

da = pytest.importorskip("dask.array")
import dask  # noqa: E402

import qdm  # noqa: E402
import qdm.dask as qd  # noqa: E402

# The all-zero record is rank deficient for some fits: its status says so.
pytestmark = pytest.mark.filterwarnings("ignore::qdm.RankDeficientWarning")

N = 96
# (fit, keywords): the shapes and kinds of output each fit has.
CASES = [
    ("covariance", dict(order=4)),
    ("pcar", dict(order=8, components=4)),
    ("prony", dict(order=4, fs=100.0)),
    ("matrix_pencil", dict(modes=4, pencil=30)),
    ("matrix_pencil", dict(modes=2, solver="krylov", sort=False)),
    ("mdl_order", dict(pencil=20)),
    ("covariance_psd", dict(order=4, nfft=64)),
    ("pcar_psd", dict(order=8, components=4, nfft=64)),
]
IDS = [f"{f}-{i}" for i, (f, _) in enumerate(CASES)]


def _records(shape, complex_data, seed=7):
    """Two damped modes in noise per record, frequencies varying by record;
    one record NaN in its middle and one all zero (records 1 and 2 of the
    flattened batch): a failing and a degenerate record beside good ones."""
    rng = np.random.default_rng(seed)
    count = int(np.prod(shape))
    t = np.arange(N)
    f = rng.uniform(0.05, 0.2, (count, 1))
    z = np.exp((-0.01 + 2j * np.pi * f) * t) + 0.7 * np.exp((-0.02 + 2j * np.pi * (f + 0.15)) * t)
    noise = rng.standard_normal((count, N)) + 1j * rng.standard_normal((count, N))
    x = z + 0.05 * noise if complex_data else z.real + 0.05 * noise.real
    x[1, N // 2] = np.nan
    x[2] = 0.0
    return x.reshape(tuple(shape) + (N,))


def _same(got, want):
    """Bit-identical: the same field names, shapes, dtypes and bytes (NaNs too)."""
    assert type(got).__name__ == type(want).__name__
    assert got._fields == want._fields
    for name, g, w in zip(want._fields, got, want):
        g, w = np.asarray(g), np.asarray(w)
        assert (g.shape, g.dtype) == (w.shape, w.dtype), name
        assert g.tobytes() == w.tobytes(), name


def _serial(fit, x, axis, kw):
    with np.testing.suppress_warnings() as sup:
        sup.filter(qdm.RankDeficientWarning)
        return getattr(qdm, fit)(x, axis=axis, workers=1, **kw)


@pytest.mark.parametrize("fit,kw", CASES, ids=IDS)
@pytest.mark.parametrize("complex_data", [False, True], ids=["real", "complex"])
def test_threaded_scheduler_equals_the_serial_call_bit_for_bit(fit, kw, complex_data):
    x = _records((3, 4), complex_data)
    want = _serial(fit, x, -1, kw)
    status = np.asarray(want.status).ravel()
    assert status[1] < 0 and (status[3:] >= 0).all()  # the NaN record fails, no other
    lazy = getattr(qd, fit)(da.from_array(x, chunks=(2, 3, 40)), **kw)
    assert lazy.status.chunks[:2] == ((2, 1), (3, 1))  # the records keep their chunks
    with dask.config.set(scheduler="threads", num_workers=2):
        got = dask.compute(*lazy)
    _same(type(want)(*got), want)


@pytest.mark.parametrize("axis", [0, 1, -3])
def test_the_samples_axis_may_be_any_axis(axis):
    x = np.moveaxis(_records((2, 3), False), -1, axis)
    want = _serial("prony", x, axis, dict(order=4))
    got = qd.prony(da.from_array(x, chunks=16), axis=axis, order=4)
    _same(type(want)(*dask.compute(*got, scheduler="sync")), want)


def test_a_one_dimensional_array_is_one_record_with_its_status():
    x = _records((3,), True)
    for i in (1, 2, 0):
        got = dask.compute(*qd.matrix_pencil(da.from_array(x[i]), modes=4), scheduler="sync")
        want = _serial("matrix_pencil", x[i:i + 1], -1, dict(modes=4))
        _same(type(want)(*got), type(want)(*(v if k == "frequencies" else v[0]
                                              for k, v in zip(want._fields, want))))
    assert got[-1] == 0
    assert qd.covariance(da.from_array(x[1]), order=3).status.compute() < 0  # the NaN record


def test_building_the_graph_reads_nothing_of_x(monkeypatch):
    reads, fits = [], []
    block_function = qd._records
    monkeypatch.setattr(qd, "_records", lambda *a, **k: fits.append(1) or block_function(*a, **k))

    def source(block):
        reads.append(block.shape)
        return block

    base = da.from_array(_records((4,), False), chunks=(2, N))
    x = base.map_blocks(source, meta=np.empty((0, 0)))  # meta given: Dask calls nothing
    lazy = [getattr(qd, fit)(x, **kw) for fit, kw in CASES]
    assert reads == [] and fits == []  # not even on empty arrays to learn the outputs
    assert [a.shape for a in lazy[3]][:2] == [(4, 4), (4, 4)]
    dask.compute(lazy[0], scheduler="sync")
    assert sorted(reads) == [(2, N), (2, N)] and len(fits) == 2


def test_bad_keywords_raise_when_the_graph_is_built():
    x = da.from_array(_records((3,), False))
    with pytest.raises(qdm.ArgumentError, match="order"):
        qd.covariance(x, order=N)
    with pytest.raises(TypeError):
        qd.prony(x, order=2.5)
    with pytest.raises(qdm.DTypeError):
        qd.covariance(x.astype(object), order=2)
    with pytest.raises(np.AxisError):
        qd.covariance(x, order=2, axis=2)


def test_an_empty_batch_gives_empty_fields():
    got = qd.matrix_pencil(da.zeros((0, N), chunks=(5, N)), modes=3)
    assert got.frequency.shape == (0, 3) and got.status.compute().shape == (0,)


def test_the_module_examples_run():
    assert doctest.testmod(qd, optionflags=doctest.NORMALIZE_WHITESPACE).failed == 0


def test_without_dask_the_import_names_the_package():
    code = ("import sys; sys.modules['dask'] = sys.modules['dask.array'] = None\n"
            "try:\n import qdm.dask\nexcept ImportError as e:\n print(e)")
    out = subprocess.run([sys.executable, "-c", code], capture_output=True, text=True,
                         env=os.environ, timeout=60)
    assert "python3-dask" in out.stdout, out.stderr


def test_xarray_apply_ufunc_runs_a_fit_per_chunk():
    xr = pytest.importorskip("xarray")
    x = _records((6,), False)
    data = xr.DataArray(x, dims=("sensor", "time")).chunk({"sensor": 2})
    freq = xr.apply_ufunc(lambda r: qdm.matrix_pencil(r, modes=4, workers=1).frequency, data,
                          input_core_dims=[["time"]], output_core_dims=[["mode"]],
                          dask="parallelized", output_dtypes=[float],
                          dask_gufunc_kwargs={"output_sizes": {"mode": 4}})
    want = _serial("matrix_pencil", x, -1, dict(modes=4)).frequency
    assert freq.compute().values.tobytes() == want.tobytes()


# The Debian tornado's own deprecation, raised inside distributed.
@pytest.mark.filterwarnings("ignore:make_current is deprecated:DeprecationWarning")
def test_a_cluster_of_two_worker_processes_equals_the_serial_call():
    distributed = pytest.importorskip("distributed")
    started = time.monotonic()
    # A cluster that hangs while starting or stopping ends the run, with every
    # thread's traceback, rather than holding the suite.
    faulthandler.dump_traceback_later(180, exit=True)
    # The workers are new processes: they find qdm and its library through the
    # environment (PYTHONPATH, QDM_LIBRARY), which they inherit.
    cluster = distributed.LocalCluster(n_workers=2, threads_per_worker=1, processes=True,
                                       host="127.0.0.1", dashboard_address=None,
                                       silence_logs=40)
    try:
        with distributed.Client(cluster) as client:
            pids = client.run(os.getpid)
            assert len(set(pids.values()) | {os.getpid()}) == 3
            x = _records((12,), False)
            lazy = qd.matrix_pencil(da.from_array(x, chunks=(3, N)), modes=4)
            with distributed.get_task_stream(client) as stream:
                got = client.compute(list(lazy), sync=True)
            _same(type(lazy)(*got), _serial("matrix_pencil", x, -1, dict(modes=4)))
            # The fits ran in the worker processes, not here.
            assert {t["worker"] for t in stream.data} <= set(pids)
            z = _records((2, 5), True)
            lazy = qd.covariance_psd(da.from_array(z, chunks=(1, 5, N)), order=4)
            got = client.compute(list(lazy), sync=True)
            _same(type(lazy)(*got), _serial("covariance_psd", z, -1, dict(order=4)))
    finally:
        cluster.close(timeout=60)
        faulthandler.cancel_dump_traceback_later()
    assert time.monotonic() - started < 120
