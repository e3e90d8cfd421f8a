"""The records of a corpus by the engines that there are: the same rows from each, in its own order."""

from __future__ import annotations

import os
import shutil
from collections.abc import Iterator
from pathlib import Path
from typing import Any

import pytest

from quillet import corpus

pyarrow = pytest.importorskip("pyarrow")

SOURCES = [(f"{number}.py", f"class C{number}:\n    def f(self, x=1): return x.y\n".encode()) for number in range(40)]
SOURCES += [("broken.py", b"def f(:\n"), ("empty.py", b""), ("odd.py", b"# coding: klingon\n")]
OPTIONS: dict[str, Any] = {"keep": ["package"], "version": (3, 12)}


def source_table() -> Any:
    paths, contents = zip(*SOURCES, strict=True)
    packages = [f"p{number % 3}" for number in range(len(SOURCES))]
    return pyarrow.table({"package": packages, "path": paths, "content": contents})


def rows_of(table: Any) -> list[tuple]:
    return sorted((tuple(row.values()) for row in table.to_pylist()), key=repr)


def expected() -> list[tuple]:
    rows = rows_of(pyarrow.Table.from_batches(list(corpus.records(source_table(), **OPTIONS))))
    assert len(rows) > 200
    return rows


@pytest.fixture(scope="module")
def spark() -> Iterator[Any]:
    sql = pytest.importorskip("pyspark.sql")
    if shutil.which("java") is None:
        pytest.skip("Spark needs Java")
    os.environ["PYSPARK_PYTHON"] = os.sys.executable
    builder = sql.SparkSession.builder.master("local[1]").config("spark.ui.enabled", "false")
    session = builder.config("spark.driver.bindAddress", "127.0.0.1").config("spark.driver.host", "127.0.0.1")
    session = session.getOrCreate()
    session.sparkContext.setLogLevel("ERROR")
    yield session
    session.stop()


def test_spark(spark: Any) -> None:
    from quillet.corpus.spark import records

    frame = spark.createDataFrame(source_table().to_pandas()).repartition(3)
    found = records(frame, **OPTIONS)
    assert [field.dataType.simpleString() for field in found.schema][1:4] == ["string", "int", "int"]
    assert rows_of(found.toArrow()) == expected()
    names = records(frame, occurrences=True, **OPTIONS)
    direct = pyarrow.Table.from_batches(list(corpus.records(source_table(), occurrences=True, **OPTIONS)))
    assert rows_of(names.toArrow()) == rows_of(direct)


def test_ray() -> None:
    pytest.importorskip("ray.data")
    import ray

    from quillet.corpus.ray import records

    ray.init(num_cpus=1, include_dashboard=False, log_to_driver=False, logging_level="error")
    try:
        found = records(ray.data.from_arrow(source_table()).repartition(3), **OPTIONS)
        tables = [pyarrow.table(ray.get(block)) for block in found.to_arrow_refs()]
        assert rows_of(pyarrow.concat_tables(tables)) == expected()
    finally:
        ray.shutdown()


def pandas_frame() -> Any:
    """The sources with bytes as such: Dask takes objects for strings."""
    import pandas

    frame = source_table().to_pandas()
    return frame.assign(content=frame["content"].astype(pandas.ArrowDtype(pyarrow.binary())))


def test_dask_data_frame() -> None:
    frames = pytest.importorskip("dask.dataframe")
    from quillet.corpus.dask import records

    frame = frames.from_pandas(pandas_frame(), npartitions=3)
    found = records(frame, **OPTIONS).compute(scheduler="synchronous")
    assert rows_of(pyarrow.Table.from_pandas(found, preserve_index=False)) == expected()


def test_dask_data_frame_of_categories() -> None:
    frames = pytest.importorskip("dask.dataframe")
    from quillet.corpus.dask import records

    frame = pandas_frame().astype({"package": "category", "path": "category"})
    found = records(frames.from_pandas(frame, npartitions=4), **OPTIONS).compute(scheduler="synchronous")
    assert rows_of(pyarrow.Table.from_pandas(found, preserve_index=False)) == expected()


def test_dask_bag() -> None:
    bags = pytest.importorskip("dask.bag")
    from quillet.corpus.dask import records_of_bag

    bag = bags.from_sequence(source_table().to_pylist(), npartitions=3)
    rows = records_of_bag(bag, **OPTIONS).compute(scheduler="synchronous")
    assert sorted((tuple(row.values()) for row in rows), key=repr) == expected()


def test_adapters_are_thin() -> None:
    folder = Path(corpus.__file__).parent
    for name in ("spark", "ray", "dask"):
        code = [line for line in (folder / f"{name}.py").read_text().splitlines() if line.strip()]
        assert len(code) <= 30, name
