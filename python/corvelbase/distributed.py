"""OCR of large collections on a Dask cluster.

:func:`ocr_many` sends every page to the cluster as a task, at most a window of them at
a time, so a list of millions of paths costs the scheduler no more than a few hundred
tasks. Each worker process keeps one engine pool (set up by a worker plugin, sized to
the worker's threads) and writes each page's text to ``OUT/NAME.txt`` itself, atomically,
so the output folder only ever holds whole pages. A page whose text is already there is
skipped, so a run that was stopped is finished by running it again; a page that fails
gets ``OUT/NAME.error.json`` (the error's domain, code and reason) and is reported, and
is tried again by the next run. The paths must be readable by the workers and the
output folder writable by them: on several hosts, a shared file system.

One machine::

    from dask.distributed import Client, LocalCluster
    client = Client(LocalCluster(n_workers=2, threads_per_worker=1))
    report = corvelbase.distributed.ocr_many(paths, "out/", client=client)
"""
from __future__ import annotations

import json
import os
import time
import uuid
from dataclasses import dataclass, field
from pathlib import Path
from typing import Any, Callable, Iterable

import distributed
from distributed.diagnostics.plugin import WorkerPlugin

import corvelbase

from . import _corvelbase as _native

_PLUGIN_NAME = "corvelbase-engine"
_ERROR_SUFFIX = ".error.json"
# The engine settings this worker process runs with: a run that registers the plugin
# again with the same settings keeps the engines already started.
_engine_settings: dict | None = None


class EnginePlugin(WorkerPlugin):
    """Gives each worker process one engine pool with as many recognitions at once as
    the worker has threads, and lets its idle engines go when the worker closes."""

    name = _PLUGIN_NAME

    def __init__(self, **engine: Any) -> None:
        self.engine = engine

    def setup(self, worker: Any) -> None:
        global _engine_settings
        settings = dict(self.engine)
        settings.setdefault("concurrency", worker.state.nthreads)
        if settings != _engine_settings:
            corvelbase.configure_engine(**settings)
            _engine_settings = settings

    def teardown(self, worker: Any) -> None:
        corvelbase.release_idle_engines()


@dataclass(frozen=True)
class Failure:
    """A page that could not be read, with the error's domain, code and reason."""

    path: str
    domain: str
    code: int
    reason: str


@dataclass
class Report:
    """What a run did: the pages it wrote, those already there, and those that failed."""

    done: list[str] = field(default_factory=list)
    skipped: list[str] = field(default_factory=list)
    failed: list[Failure] = field(default_factory=list)
    seconds: float = 0.0


@dataclass(frozen=True)
class PageOutcome:
    """One page's outcome as the run learns it: ``"done"`` or ``"failed"``."""

    path: str
    output: str
    status: str
    failure: Failure | None = None


def output_name(path: str | os.PathLike[str]) -> str:
    """The name a page's text is written under: its file name without the extension."""
    return Path(path).stem


def _write(path: Path, data: str) -> None:
    if not _native.write_file_atomically(os.fsencode(path), data.encode()):
        raise OSError(f"cannot write {path}")


def _ocr_page(path: str, output: str, options: dict) -> tuple:
    """The task: one page read and written on a worker."""
    target = Path(output)
    error_file = target.with_name(target.stem + _ERROR_SUFFIX)
    if target.exists():  # another run wrote it meanwhile
        return ("skipped",)
    try:
        result = corvelbase.ocr(path, **options)
    except corvelbase.Error as error:
        _write(error_file, json.dumps({"path": path, "domain": error.domain,
                                       "code": error.code, "reason": error.reason}))
        return ("failed", error.domain, error.code, error.reason)
    _write(target, result.text)
    error_file.unlink(missing_ok=True)
    return ("done",)


def _has_plugin(dask_worker: Any) -> bool:
    return _PLUGIN_NAME in dask_worker.plugins


def _ensure_plugin(client: distributed.Client) -> None:
    # Registering it again would tear down and set up every worker's engines.
    present = client.run(_has_plugin)
    if not present or not all(present.values()):
        client.register_worker_plugin(EnginePlugin(), name=_PLUGIN_NAME)


def ocr_many(paths: Iterable[str | os.PathLike[str]], out: str | os.PathLike[str],
             client: distributed.Client | None = None, *,
             languages: Iterable[str] | str | None = None, level: str = "accurate",
             order: str = "rows", timeout: float | None = None, window: int | None = None,
             on_page: Callable[[PageOutcome], None] | None = None) -> Report:
    """Recognises every page of ``paths`` on the cluster of ``client``, writing
    ``out/NAME.txt`` for each (NAME: the file name without its extension).

    ``client``: a ``dask.distributed.Client``; none uses the current client, or, when
    there is none, a ``LocalCluster`` made for this call. ``languages``, ``level``,
    ``order`` and ``timeout`` are those of :func:`corvelbase.ocr`. ``window``: tasks in
    flight at once (default: four per worker thread). ``on_page`` is called on this thread
    as each page is done or has failed; an exception it raises stops the run (the tasks
    not started are cancelled; pages finished so far stay written).

    Two inputs with the same NAME would write the same file: the later one is reported
    as failed instead. Returns a :class:`Report`.
    """
    out = Path(out)
    out.mkdir(parents=True, exist_ok=True)
    options = {"languages": languages, "level": level, "order": order, "timeout": timeout}
    corvelbase._jobs._options(languages, level, order, timeout)  # refuse bad options here
    if client is None:
        try:
            client = distributed.get_client()
        except ValueError:
            with distributed.LocalCluster() as cluster, distributed.Client(cluster) as own:
                return ocr_many(paths, out, own, languages=languages, level=level,
                                order=order, timeout=timeout, window=window,
                                on_page=on_page)
    _ensure_plugin(client)
    if window is None:
        window = 4 * max(1, sum(client.nthreads().values()))
    started = time.monotonic()
    report = Report()
    names: set[str] = set()
    in_flight: dict[distributed.Future, tuple[str, str]] = {}
    run = uuid.uuid4().hex[:8]

    def settle(future: distributed.Future) -> None:
        path, target = in_flight.pop(future)
        try:
            status, *error = future.result()
        except Exception as exc:  # the task itself failed: a worker lost, an unwritable folder
            status, error = "failed", [type(exc).__name__, 0, str(exc)]
        if status == "skipped":
            report.skipped.append(path)
            return
        failure = Failure(path, *error) if status == "failed" else None
        (report.failed.append(failure) if failure else report.done.append(path))
        if on_page is not None:
            on_page(PageOutcome(path, target, status, failure))

    try:
        for path in map(os.fspath, paths):
            name = output_name(path)
            target = out / f"{name}.txt"
            if name in names:
                failure = Failure(path, "corvelbase.distributed", 1,
                                  f"another input is also written to {target}")
                report.failed.append(failure)
                if on_page is not None:
                    on_page(PageOutcome(path, str(target), "failed", failure))
                continue
            names.add(name)
            if target.exists():
                report.skipped.append(path)
                continue
            while len(in_flight) >= window:
                done, _ = distributed.wait(list(in_flight), return_when="FIRST_COMPLETED")
                for future in done:
                    settle(future)
            future = client.submit(_ocr_page, path, str(target), options, pure=False,
                                   key=f"corvelbase-ocr-{name}-{run}")
            in_flight[future] = (path, str(target))
        while in_flight:
            done, _ = distributed.wait(list(in_flight), return_when="FIRST_COMPLETED")
            for future in done:
                settle(future)
    finally:
        if in_flight:
            client.cancel(list(in_flight))
    report.seconds = time.monotonic() - started
    return report
