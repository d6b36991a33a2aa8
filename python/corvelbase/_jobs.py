"""Recognition jobs as futures on the library's shared queue."""
from __future__ import annotations

import concurrent.futures
import os
import urllib.parse
import urllib.request
from typing import Any, Iterable, Union

from . import _corvelbase as _native
from .errors import error_from
from .results import Result, page_from_tuple

#: What can be recognised: a path (or a ``file:`` URL) or the bytes of an image, a
#: multi-page TIFF or a PDF; or pixels (a NumPy array or any buffer of unsigned bytes
#: shaped (height, width) or (height, width, channels) with 1, 3 or 4 channels).
Source = Union[str, "os.PathLike[str]", bytes, bytearray, memoryview, Any]

_ORDERS = {
    "rows": _native.READING_ORDER_ROWS,
    "engine": _native.READING_ORDER_ENGINE,
    "layout": _native.READING_ORDER_LAYOUT,
}
_LEVELS = {"accurate": False, "fast": True}


class OcrFuture(concurrent.futures.Future):
    """A recognition job's future. ``cancel()`` works whether the job is still waiting for
    the queue or already running (the engine is stopped between words); a cancelled
    job's result raises ``concurrent.futures.CancelledError``."""

    _job: Any = None
    _delivered = False
    _name: str | None = None

    def cancel(self) -> bool:
        with self._condition:
            if not super().cancel():
                return False
            job = self._job
        if job is not None:
            job.stop()
        return True

    def _attach(self, job: Any) -> None:
        # The job is kept only until its outcome arrives: it holds the page's tree.
        with self._condition:
            if not self._delivered:
                self._job = job

    def _deliver(self, native: Any, pages: tuple, error: Any) -> None:
        # Called once, on the module's delivery thread (or at once, for a job that could
        # not start).
        outcome: Any
        if error is not None:
            outcome = error_from(*error)
        else:
            read = tuple(page_from_tuple(page) for page in pages)
            failed = [page.error for page in read if page.error is not None]
            # Nothing was read: an image that failed fails as its page did.
            if read and len(failed) == len(read):
                outcome = failed[0]
            else:
                outcome = Result("\f".join(page.text for page in read), read, self._name,
                                 native)
        with self._condition:
            self._delivered = True
            self._job = None
        try:
            if isinstance(outcome, BaseException):
                self.set_exception(outcome)
            else:
                self.set_result(outcome)
        except concurrent.futures.InvalidStateError:
            pass  # cancelled meanwhile: the outcome has no one left to go to


def _options(languages: Iterable[str] | str | None, level: str, order: str,
             timeout: float | None, force_ocr: bool = False) -> Any:
    options = _native.JobOptions()
    if isinstance(languages, str):
        languages = [languages]
    options.languages = list(languages or [])
    if level not in _LEVELS:
        raise ValueError(f"level must be 'accurate' or 'fast', not {level!r}")
    options.fast = _LEVELS[level]
    if order not in _ORDERS:
        raise ValueError(f"order must be one of {', '.join(_ORDERS)}, not {order!r}")
    options.order = _ORDERS[order]
    if timeout is not None and not timeout > 0:
        raise ValueError("timeout must be a number of seconds above 0")
    options.timeout = float(timeout or 0)
    options.force_ocr = bool(force_ocr)
    return options


def _path(source: str | os.PathLike[str]) -> str | os.PathLike[str]:
    """The path a ``file:`` URL names; other paths as they are."""
    if isinstance(source, str) and ("://" in source or source.startswith("file:")):
        url = urllib.parse.urlparse(source)
        if url.scheme != "file" or url.netloc not in ("", "localhost"):
            raise ValueError(f"only file: URLs can be read, not {source!r}")
        return urllib.request.url2pathname(url.path)
    return source


def _pixels(source: Any) -> Any:
    """A buffer the compiled module reads without a copy: the source itself when its
    layout allows, else a packed copy (NumPy's) of it."""
    view = memoryview(source)
    packed = (view.ndim in (2, 3) and view.strides[0] > 0
              and view.strides[1] == (view.shape[2] if view.ndim == 3 else 1)
              and (view.ndim == 2 or view.strides[2] == 1))
    if packed or view.format != "B":
        return source  # packed, or refused below with the reason
    import numpy

    return numpy.ascontiguousarray(source)


def submit(source: Source, *, languages: Iterable[str] | str | None = None,
           level: str = "accurate", order: str = "rows", timeout: float | None = None,
           force_ocr: bool = False) -> OcrFuture:
    """Starts recognising ``source`` on the library's shared queue and returns its future
    at once. See :func:`ocr` for the arguments."""
    options = _options(languages, level, order, timeout, force_ocr)
    future = OcrFuture()
    if isinstance(source, (str, os.PathLike)):
        start = _native.submit_path
        future._name = options.name = os.fsdecode(source)
        source = os.fsencode(_path(source))
    elif isinstance(source, (bytes, bytearray)) or (
            isinstance(source, memoryview) and source.ndim <= 1):
        start = _native.submit_data
    else:
        try:
            memoryview(source)
        except TypeError:
            raise TypeError("source must be a path, the bytes of an image file, or pixels "
                            f"(an array of unsigned bytes), not {type(source).__name__}") from None
        start = _native.submit_pixels
        source = _pixels(source)
    future._attach(start(source, options, future._deliver))
    return future


def ocr(source: Source, *, languages: Iterable[str] | str | None = None,
        level: str = "accurate", order: str = "rows", timeout: float | None = None,
        force_ocr: bool = False) -> Result:
    """Recognises the text of an image or of every page of a document and returns the
    :class:`Result`, one :class:`Page` per page.

    ``source`` is a path or ``file:`` URL, or the bytes of a file: an image (PNG, JPEG,
    TIFF, BMP, GIF, WebP, PNM), a multi-page TIFF or a PDF; or pixels: a NumPy array (or
    any buffer) of unsigned bytes shaped (height, width) for grey or (height, width, 3 or
    4) for RGB or RGBA. Pixels
    are read where they lie when each row's pixels lie side by side (rows may be apart,
    as in a slice of a larger picture); any other layout is packed into a copy first.

    ``languages``: codes such as ``"en-US"`` or ``["ja-JP", "en-US"]``; none detects the
    script and language. ``level``: ``"accurate"`` or ``"fast"``. ``order``: ``"rows"``
    (the engine's blocks with side-by-side short lines read row by row; the default, as
    on the command line), ``"engine"`` or ``"layout"`` (the library's layout analysis of
    columns and paragraphs). ``timeout``: seconds each page may take. ``force_ocr``: read
    the PDF pages that already hold text too (by default they keep their own text).

    The GIL is released while the engine works. Raises an :class:`~corvelbase.Error`
    subclass for a failure the library reports: a source that cannot be opened, or pages
    none of which could be read; a document some of whose pages failed gives its result,
    with each failed page's ``error``. Ctrl-C stops the job.
    """
    future = submit(source, languages=languages, level=level, order=order, timeout=timeout,
                    force_ocr=force_ocr)
    try:
        return future.result()
    except BaseException:
        future.cancel()
        raise
