"""Corvelbase for Python: OCR of images and documents (PDF, multi-page TIFF) on the
Tesseract engine with our own layout analysis, Markdown editing commands, and string
utilities.

    >>> import corvelbase
    >>> corvelbase.ocr("page.png", languages=["en-US"]).text
    >>> corvelbase.ocr("scan.pdf").save("scan-searchable.pdf")

:func:`ocr` recognises an image or a document and waits; :func:`submit` returns a
``concurrent.futures.Future`` at once, so many pages run together on the library's
shared queue (the GIL is released while the engine works). :func:`write` writes
results as text, JSON, hOCR, ALTO, TSV or a searchable PDF. ``corvelbase.distributed``
runs OCR over collections on a Dask cluster; ``corvelbase.markdown`` has the editing
commands and ``corvelbase.uti`` the type identifiers.
"""
from __future__ import annotations

import atexit
from dataclasses import dataclass
from typing import Iterable

from . import _corvelbase as _native
from . import markdown, uti
from ._jobs import OcrFuture, Source, ocr, submit
from .errors import (DocumentDamagedError, DocumentEncryptedError, DocumentUnreadableError,
                     EngineError, Error, ImageUnreadableError, NoRecognizerError,
                     PageRangeError, RecognitionCancelledError, RecognitionTimeoutError,
                     UnreadableError, UnsupportedLanguageError, UnsupportedSystemError,
                     WriteError)
from .results import (FORMATS, Block, Box, Level, Page, Result, Word, block_from_tuple, render,
                      write)

__all__ = [
    "ocr", "submit", "OcrFuture", "Source", "Result", "Page", "Block", "Word", "Box",
    "Level", "write", "render", "FORMATS",
    "Error", "UnreadableError", "ImageUnreadableError", "DocumentUnreadableError",
    "DocumentDamagedError", "DocumentEncryptedError", "PageRangeError", "WriteError",
    "UnsupportedLanguageError", "EngineError", "NoRecognizerError", "RecognitionTimeoutError",
    "RecognitionCancelledError", "UnsupportedSystemError", "Language", "languages", "is_valid_language_combination",
    "supports_fast_recognition", "order_languages", "configure_engine",
    "release_idle_engines", "analyse_layout", "dominant_language", "header_value",
    "contains_asian_characters", "markdown", "uti",
]

# Stops running jobs and lets the library's threads out of the interpreter before it
# goes away.
atexit.register(_native.shutdown)


# --- the recognition languages --------------------------------------------------------

@dataclass(frozen=True, slots=True)
class Language:
    """An entry of the language catalogue."""

    code: str
    name: str
    #: The code the recogniser is given (the Cantonese entries use the Chinese models).
    iso_code: str
    #: The codes this language may be combined with; empty when it combines freely.
    secondary: tuple[str, ...]
    #: Whether it must come first in a list of languages.
    force_primary: bool
    #: Whether its model is installed, at the accurate and at the fast level.
    installed: bool
    fast: bool


def languages() -> list[Language]:
    """The catalogue's 14 languages, by code."""
    def codes(level: int) -> set[str]:
        entries = _native.supported_languages(level) or []
        return {entry["isoCode"] for entry in entries}

    accurate, fast = codes(0), codes(1)
    out = []
    for code, entry in _native.all_languages().items():
        iso = entry["isoCode"]
        out.append(Language(code, entry["name"], iso, tuple(entry.get("secondary", ())),
                            bool(entry.get("forcePrimary", False)), iso in accurate,
                            iso in fast and _native.supports_fast_recognition([code])))
    return out


def is_valid_language_combination(codes: Iterable[str]) -> bool:
    """Whether the codes may be recognised together: an empty list, or an East-Asian
    language first with only itself or English after it."""
    return _native.is_language_combination_valid(list(codes))


def supports_fast_recognition(codes: Iterable[str]) -> bool:
    """Whether the fast level may be offered for the codes."""
    return _native.supports_fast_recognition(list(codes))


def order_languages(codes: Iterable[str]) -> list[str]:
    """The codes in the order the recogniser is given them: the first language that must
    come first moved to the front."""
    return _native.order_language_codes(list(codes))


# --- the engine -----------------------------------------------------------------------

def configure_engine(*, concurrency: int = 0, data_path: str = "",
                     idle_model_bytes: int = 0, fast_max_long_side: int = 0,
                     timeout_per_megapixel: float = 0, min_timeout: float = 0) -> None:
    """Installs a new Tesseract engine pool for this process (0 or "" keeps a default).

    ``concurrency``: recognitions at once (default: the number of cores); ``data_path``:
    the folder of the ``*.traineddata`` models (default: ``$TESSDATA_PREFIX``, else
    Debian's); ``idle_model_bytes``: model data idle engines may keep loaded;
    ``fast_max_long_side``: the fast level's cap on the picture's long side, in pixels;
    ``timeout_per_megapixel`` and ``min_timeout``: the deadline of a page without a
    timeout of its own, in seconds. Swap engines while no job runs.
    """
    _native.configure_engine(data_path, concurrency, idle_model_bytes, fast_max_long_side,
                             timeout_per_megapixel, min_timeout)


def release_idle_engines() -> None:
    """Stops the engines no recognition is using, giving back their memory."""
    _native.release_idle_engines()


# --- layout analysis and strings ------------------------------------------------------

def analyse_layout(lines: Iterable[tuple[str, tuple[float, float, float, float], float]]
                   ) -> Page:
    """The library's layout analysis of lines from any engine.

    Each line is (text, (x, y, width, height), confidence) with the box normalised to the
    page, origin at the bottom left. The page's blocks are its columns, holding their
    paragraphs and lines; its text is in reading order, paragraphs and columns joined by
    a blank line.
    """
    text, columns = _native.analyse_layout(
        (line if not isinstance(line, Block) else (line.text, _box(line.box), line.confidence))
        for line in lines)
    return Page(text, tuple(block_from_tuple(column) for column in columns))


def _box(box: Box) -> tuple[float, float, float, float]:
    return (box.x, box.y, box.width, box.height)


def dominant_language(text: str) -> str | None:
    """The dominant language of the text ("en", "fr", "zh", ...) from its first 4,096
    UTF-16 units, or None when the text is empty or no language can be told."""
    return _native.dominant_language(text)


def header_value(message: str, field: str, *, address: bool = False) -> str | None:
    """The value of an e-mail header: the rest of the first line that starts with the
    field name (any case), a colon and one white-space character; with ``address``, the
    e-mail address in it. None when there is none. ``field`` is a regular expression."""
    return _native.header_value(message, field, address)


def contains_asian_characters(text: str) -> bool:
    """Whether the text holds CJK characters (U+2E80 to U+9FFF beginning a character)."""
    return _native.contains_asian_characters(text)
