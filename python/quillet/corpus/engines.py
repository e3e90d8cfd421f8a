"""What runs the shards of a corpus: processes of this machine, or an engine that has others.

Each engine gives (shard, summary) for shards as they are completed, in any order. All of them run `run_shard`, whose
files are to be seen by every worker under the same name. A worker that dies takes nothing with it but the shard that
it was at, which another one does again.
"""

from __future__ import annotations

import multiprocessing
import os
import threading
from collections.abc import Callable, Iterator, Sequence
from typing import Any

from quillet.corpus.shards import CorpusError, Plan, Summary, run_shard, summary_of, task_of

Done = Iterator[tuple[int, Summary]]
# Times in a row that workers of this machine may die without completing a shard.
_MOST_DEATHS = 5
_RETRIES = 5
# What a worker of Dask may keep of the memory that a source took. The half of it is the most that glibc takes for the
# size from which a piece is asked of the system, and given back, by itself.
_KEPT_BYTES = 64 << 20
# Seconds between two looks at what has been completed.
_POLL = 0.3


def run_local(plan: Plan, shards: Sequence[int], jobs: int, address: str | None) -> Done:
    """Runs shards by processes of this machine, without any where there is one job."""
    if address is not None:
        raise CorpusError("processes of this machine have no scheduler")
    if jobs == 1:
        for shard in shards:
            yield shard, run_shard(plan, shard)
        return
    from concurrent.futures import ProcessPoolExecutor, as_completed
    from concurrent.futures.process import BrokenProcessPool

    left = list(shards)
    deaths = 0
    while left:
        pool = ProcessPoolExecutor(jobs, multiprocessing.get_context("spawn"), initializer=_end_with_parent)
        try:
            futures = {pool.submit(run_shard, *task_of(plan, shard)): shard for shard in left}
            for future in as_completed(futures):
                summary = future.result()
                deaths = 0
                left.remove(futures[future])
                yield futures[future], summary
        except BrokenProcessPool:
            deaths += 1
            if deaths >= _MOST_DEATHS:
                raise CorpusError(f"workers died {deaths} times in a row; {len(left)} shards are left") from None
        finally:
            pool.shutdown(wait=False, cancel_futures=True)


def run_dask(plan: Plan, shards: Sequence[int], jobs: int, address: str | None) -> Done:
    """Runs shards by the workers of a Dask scheduler, or by those of one that is started for it."""
    distributed = _load("distributed", "dask")
    if address is None:
        import dask

        # Its workers look at their own stacks a hundred times a second, for a dashboard that nobody sees here. And
        # they are told to give each 64 KiB back to the system at once, which has to clear them for the next source.
        environment = "distributed.nanny.pre-spawn-environ"
        dask.config.set(
            {
                "distributed.worker.profile.enabled": False,
                f"{environment}.MALLOC_TRIM_THRESHOLD_": _KEPT_BYTES,
                f"{environment}.MALLOC_MMAP_THRESHOLD_": _KEPT_BYTES // 2,
            }
        )
        cluster = distributed.LocalCluster(n_workers=jobs, threads_per_worker=1, dashboard_address=None)
        client = distributed.Client(cluster)
    else:
        cluster, client = None, distributed.Client(address)
    try:
        futures = [
            client.submit(run_shard, *task_of(plan, shard), retries=_RETRIES, pure=False, key=f"quillet-{shard}")
            for shard in shards
        ]
        numbers = {future.key: shard for future, shard in zip(futures, shards, strict=True)}
        for future, summary in distributed.as_completed(futures, with_results=True):
            yield numbers[future.key], Summary(*summary)
    finally:
        client.close()
        if cluster is not None:
            cluster.close()


def run_ray(plan: Plan, shards: Sequence[int], jobs: int, address: str | None) -> Done:
    """Runs shards by the tasks of Ray."""
    ray = _load("ray", "ray")
    options = {"address": address} if address is not None else {"num_cpus": jobs, "include_dashboard": False}
    ray.init(log_to_driver=False, logging_level="error", **options)
    try:
        task = ray.remote(max_retries=_RETRIES)(run_shard)
        left = {task.remote(*task_of(plan, shard)): shard for shard in shards}
        while left:
            ready, _ = ray.wait(list(left))
            for reference in ready:
                yield left.pop(reference), Summary(*ray.get(reference))
    finally:
        ray.shutdown()


def run_spark(plan: Plan, shards: Sequence[int], jobs: int, address: str | None) -> Done:
    """Runs shards by the executors of Spark."""
    sql = _load("pyspark.sql", "spark")
    builder = sql.SparkSession.builder.appName("quillet corpus").master(address or f"local[{jobs}]")
    session = builder.config("spark.ui.enabled", "false").getOrCreate()
    try:
        context = session.sparkContext
        context.setLogLevel("ERROR")
        tasks = context.parallelize([task_of(plan, shard) for shard in shards], len(shards))
        run = _Thread(lambda: tasks.foreach(lambda task: run_shard(*task)))
        # Spark tells of its tasks when all are done; the files tell of each.
        left = list(shards)
        while left:
            is_over = run.wait(_POLL)
            for shard in [shard for shard in left if plan.is_done(shard)]:
                left.remove(shard)
                yield shard, summary_of(plan, shard)
            if is_over and left:
                raise CorpusError(f"Spark left {len(left)} shards: {run.error}")
    finally:
        session.stop()


class _Thread:
    """A call on a thread of its own."""

    def __init__(self, call: Callable[[], object]) -> None:
        self.error: BaseException | None = None
        self._thread = threading.Thread(target=self._run, args=(call,), daemon=True)
        self._thread.start()

    def _run(self, call: Callable[[], object]) -> None:
        try:
            call()
        except BaseException as error:
            self.error = error

    def wait(self, seconds: float) -> bool:
        """Whether it is over, after some seconds at most."""
        self._thread.join(seconds)
        return not self._thread.is_alive()


def _end_with_parent() -> None:
    """In a worker: ends it when the run is killed, which would leave it waiting for work for ever."""
    parent = multiprocessing.parent_process()
    assert parent is not None

    def wait() -> None:
        parent.join()
        os._exit(1)

    threading.Thread(target=wait, daemon=True).start()


ENGINES: dict[str, Callable[[Plan, Sequence[int], int, str | None], Done]] = {
    "local": run_local,
    "dask": run_dask,
    "ray": run_ray,
    "spark": run_spark,
}


def _load(module: str, extra: str) -> Any:
    from importlib import import_module

    try:
        return import_module(module)
    except ImportError as error:
        raise CorpusError(f"this engine needs a package: pip install quillet[{extra}]") from error
