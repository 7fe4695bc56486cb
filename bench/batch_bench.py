"""Many records at once: a Python loop over qdm.matrix_pencil against one
batch call (an N-D x) on one and on two threads, and qdm.dask on a local
Dask cluster of one and of two worker processes (one thread each), for real
records of 256 samples, M = 4 modes, pencil L = 85. Wall-clock time (the
threads are the point); each way must give the loop's results bit for bit.
The Dask times count building the graph, shipping the records to the
workers and gathering the results, not starting the cluster.

    python3 bench/batch_bench.py [--records N] [--solver auto|dense|krylov] [--chunk C]

(the package on PYTHONPATH or installed, e.g. PYTHONPATH=python
QDM_LIBRARY=build/release/libqdm_api.so). Each way is one function below
taking the records and returning (the fits' fields, seconds); the table at
the end sets them side by side."""
import argparse
import importlib.util
import time

import numpy as np

import qdm

N, M, L = 256, 4, 85


def records(count, seed=0):
    """Two damped sinusoids in noise per record, frequencies varying."""
    rng = np.random.default_rng(seed)
    t = np.arange(N)
    f = rng.uniform(0.05, 0.2, (count, 1))
    x = (np.exp(-0.005 * t) * np.cos(2 * np.pi * f * t + 0.3)
         + 0.5 * np.exp(-0.01 * t) * np.cos(2 * np.pi * (f + 0.15) * t))
    return x + 0.05 * rng.standard_normal((count, N))


def python_loop(x, solver):
    start = time.perf_counter()
    fits = [qdm.matrix_pencil(r, modes=M, pencil=L, solver=solver) for r in x]
    seconds = time.perf_counter() - start
    return [np.array([f[k] for f in fits]) for k in range(len(fits[0]))], seconds


def batch(x, solver, workers):
    start = time.perf_counter()
    fit = qdm.matrix_pencil(x, modes=M, pencil=L, solver=solver, workers=workers)
    return list(fit), time.perf_counter() - start


def batch_1(x, solver):
    return batch(x, solver, 1)


def batch_2(x, solver):
    return batch(x, solver, 2)


CHUNK = 2000  # records per Dask task: 4 MB of float64 input


def on_dask(x, solver, workers):
    import dask.array as da
    import distributed
    import qdm.dask as qd
    with distributed.LocalCluster(n_workers=workers, threads_per_worker=1, processes=True,
                                  host="127.0.0.1", dashboard_address=None,
                                  silence_logs=40) as cluster, distributed.Client(cluster) as client:
        client.wait_for_workers(workers)
        start = time.perf_counter()
        fit = qd.matrix_pencil(da.from_array(x, chunks=(CHUNK, N)), modes=M, pencil=L,
                               solver=solver)
        fields = client.compute(list(fit), sync=True)
        return fields, time.perf_counter() - start


def dask_1(x, solver):
    return on_dask(x, solver, 1)


def dask_2(x, solver):
    return on_dask(x, solver, 2)


WAYS = [("Python loop", python_loop), ("batch, workers=1", batch_1),
        ("batch, workers=2", batch_2), ("Dask, 1 worker", dask_1), ("Dask, 2 workers", dask_2)]


def main():
    p = argparse.ArgumentParser(description=__doc__.split("\n\n")[0])
    p.add_argument("--records", type=int, default=100_000)
    p.add_argument("--solver", default="auto", choices=["auto", "dense", "krylov"])
    p.add_argument("--chunk", type=int, default=CHUNK, help="records per Dask task")
    args = p.parse_args()
    globals()["CHUNK"] = args.chunk
    x = records(args.records)
    rows, reference = [], None
    for name, way in WAYS:
        if name.startswith("Dask") and importlib.util.find_spec("distributed") is None:
            continue  # python3-dask and python3-distributed not installed
        fields, seconds = way(x, args.solver)
        if reference is None:
            reference, base = fields, seconds
        same = all(np.array_equal(a, b, equal_nan=True) for a, b in zip(fields, reference))
        rows.append((name, seconds, args.records / seconds, base / seconds, same))
    print(f"{args.records} records of {N} samples, matrix pencil M = {M}, L = {L}, real, "
          f"solver={args.solver}")
    print(f"{'way':<20}{'seconds':>10}{'records/s':>12}{'vs loop':>9}  bit-identical")
    for name, seconds, rate, ratio, same in rows:
        print(f"{name:<20}{seconds:>10.2f}{rate:>12.0f}{ratio:>8.2f}x  {'yes' if same else 'NO'}")
    if not all(r[-1] for r in rows):
        raise SystemExit("a batch differs from the loop")


if __name__ == "__main__":
    main()
