"""OCR of large collections on a Dask cluster.

:func:`ocr_many` sends every input (an image, a multi-page TIFF or a PDF) to the cluster
as a task, at most a window of them at a time, so a list of millions of paths costs the
scheduler no more than a few hundred tasks. Each worker process keeps one engine pool
(set up by a worker plugin, sized to the worker's threads) and writes each input's
outputs itself, ``OUT/NAME.txt`` and any other format asked for, atomically, so the
output folder only ever holds whole files. An input whose outputs are all there is
skipped, so a run that was stopped is finished by running it again; an input that
fails, or a page of it, gets ``OUT/NAME.error.json`` (each error's page, domain, code
and reason) instead of outputs, is reported, and is tried again by the next run. The
paths must be readable by the workers and the output folder writable by them: on
several hosts, a shared file system.

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
    """An input that could not be read, with the error's domain, code and reason, and
    the page (from 1) when it was one page of a document."""

    path: str
    domain: str
    code: int
    reason: str
    page: int | None = None


@dataclass
class Report:
    """What a run did: the inputs it wrote, those already there, and those that failed
    (one entry per failed page of a document)."""

    done: list[str] = field(default_factory=list)
    skipped: list[str] = field(default_factory=list)
    failed: list[Failure] = field(default_factory=list)
    seconds: float = 0.0


@dataclass(frozen=True)
class PageOutcome:
    """One input's outcome as the run learns it: ``"done"`` or ``"failed"``, with its
    first output's path."""

    path: str
    output: str
    status: str
    failure: Failure | None = None


def output_name(path: str | os.PathLike[str]) -> str:
    """The name an input's outputs are written under: its file name without the
    extension."""
    return Path(path).stem


def _write(path: Path, data: str) -> None:
    if not _native.write_file_atomically(os.fsencode(path), data.encode()):
        raise OSError(f"cannot write {path}")


def _failures(path: str, result: Any) -> list[Failure]:
    return [Failure(path, page.error.domain, page.error.code, page.error.reason, page.index + 1)
            for page in result.pages if page.error is not None]


def _ocr_page(path: str, targets: list[tuple[str, str]], options: dict) -> tuple:
    """The task: one input read and written on a worker, in each (format, path) asked."""
    first = Path(targets[0][1])
    error_file = first.with_name(first.stem + _ERROR_SUFFIX)
    if all(Path(target).exists() for _, target in targets):  # another run wrote them
        return ("skipped",)
    try:
        result = corvelbase.ocr(path, **options)
        failures = _failures(path, result)
        if not failures:
            for format, target in targets:
                result.save(target, format)
    except corvelbase.Error as error:
        failures = [Failure(path, error.domain, error.code, error.reason)]
    if failures:
        _write(error_file, json.dumps({"path": path, "errors": [
            {"page": f.page, "domain": f.domain, "code": f.code, "reason": f.reason}
            for f in failures]}))
        return ("failed", failures)
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
             order: str = "rows", timeout: float | None = None, force_ocr: bool = False,
             formats: Iterable[str] = ("txt",), window: int | None = None,
             on_page: Callable[[PageOutcome], None] | None = None) -> Report:
    """Recognises every input of ``paths`` (images, multi-page TIFFs, PDFs) on the cluster
    of ``client``, writing ``out/NAME.EXT`` for each in each of ``formats`` (NAME: the
    file name without its extension; EXT: the format's name, ``txt`` by default; see
    :data:`corvelbase.FORMATS`). A ``pdf`` of a PDF input is its searchable copy.

    ``client``: a ``dask.distributed.Client``; none uses the current client, or, when
    there is none, a ``LocalCluster`` made for this call. ``languages``, ``level``,
    ``order``, ``timeout`` and ``force_ocr`` are those of :func:`corvelbase.ocr`.
    ``window``: tasks in flight at once (default: four per worker thread). ``on_page`` is
    called on this thread as each input is done or has failed; an exception it raises
    stops the run (the tasks not started are cancelled; inputs finished so far stay
    written).

    Two inputs with the same NAME would write the same files: the later one is reported
    as failed instead. Returns a :class:`Report`.
    """
    out = Path(out)
    formats = list(dict.fromkeys(formats))
    unknown = [f for f in formats if f not in corvelbase.FORMATS]
    if not formats or unknown:
        raise ValueError(f"formats are among {', '.join(corvelbase.FORMATS)}, not {unknown}")
    out.mkdir(parents=True, exist_ok=True)
    options = {"languages": languages, "level": level, "order": order, "timeout": timeout,
               "force_ocr": force_ocr}
    corvelbase._jobs._options(languages, level, order, timeout)  # refuse bad options here
    if client is None:
        try:
            client = distributed.get_client()
        except ValueError:
            with distributed.LocalCluster() as cluster, distributed.Client(cluster) as own:
                return ocr_many(paths, out, own, languages=languages, level=level,
                                order=order, timeout=timeout, force_ocr=force_ocr,
                                formats=formats, window=window, on_page=on_page)
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
            status, *failures = future.result()
        except Exception as exc:  # the task itself failed: a worker lost, an unwritable folder
            status, failures = "failed", [[Failure(path, type(exc).__name__, 0, str(exc))]]
        if status == "skipped":
            report.skipped.append(path)
            return
        failed = failures[0] if failures else []
        (report.failed.extend(failed) if failed else report.done.append(path))
        if on_page is not None:
            on_page(PageOutcome(path, target, status, failed[0] if failed else None))

    try:
        for path in map(os.fspath, paths):
            name = output_name(path)
            targets = [(format, str(out / f"{name}.{format}")) for format in formats]
            if name in names:
                failure = Failure(path, "corvelbase.distributed", 1,
                                  f"another input is also written to {targets[0][1]}")
                report.failed.append(failure)
                if on_page is not None:
                    on_page(PageOutcome(path, targets[0][1], "failed", failure))
                continue
            names.add(name)
            if all(Path(target).exists() for _, target in targets):
                report.skipped.append(path)
                continue
            while len(in_flight) >= window:
                done, _ = distributed.wait(list(in_flight), return_when="FIRST_COMPLETED")
                for future in done:
                    settle(future)
            future = client.submit(_ocr_page, path, targets, options, pure=False,
                                   key=f"corvelbase-ocr-{name}-{run}")
            in_flight[future] = (path, targets[0][1])
        while in_flight:
            done, _ = distributed.wait(list(in_flight), return_when="FIRST_COMPLETED")
            for future in done:
                settle(future)
    finally:
        if in_flight:
            client.cancel(list(in_flight))
    report.seconds = time.monotonic() - started
    return report
