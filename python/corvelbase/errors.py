"""Errors of the library as Python exceptions.

Every failure the library reports arrives as an :class:`Error` carrying the error's
``domain``, ``code`` and ``reason`` as the library gave them; a subclass per kind lets a
caller catch the one it can handle.
"""
from __future__ import annotations

import concurrent.futures

from . import _corvelbase as _native

#: The recognition service's error domain, the job's own (no recognition here), and
#: the documents' (opening, reading and writing them).
RECOGNITION_DOMAIN: str = _native.RECOGNITION_DOMAIN
OCR_DOMAIN: str = _native.OCR_DOMAIN
DOCUMENT_DOMAIN: str = _native.DOCUMENT_DOMAIN


class Error(Exception):
    """A failure reported by the library.

    ``domain`` and ``code`` identify the kind, ``reason`` says what went wrong in a
    sentence, and ``description`` is the library's full description of the error.
    """

    def __init__(self, domain: str, code: int, reason: str, description: str = "") -> None:
        super().__init__(f"{reason or description} ({domain} {code})")
        self.domain = domain
        self.code = code
        self.reason = reason
        self.description = description

    def __reduce__(self):  # so an error crosses process boundaries (Dask) intact
        return (_rebuild, (self.domain, self.code, self.reason, self.description))


class UnreadableError(Error):
    """The source cannot be read; its subclasses say how."""


class ImageUnreadableError(UnreadableError):
    """Pixels without area, or a picture the engine could not decode."""


class DocumentUnreadableError(UnreadableError):
    """No such file, or one that is neither a PDF nor an image that can be read."""


class DocumentDamagedError(UnreadableError):
    """A PDF or TIFF (or a page of one) too broken to read."""


class DocumentEncryptedError(UnreadableError):
    """A PDF that needs a password."""


class PageRangeError(Error, IndexError):
    """No such page."""


class WriteError(Error, OSError):
    """An output that could not be made or written."""


class UnsupportedLanguageError(Error, ValueError):
    """A language code without an installed recognition model."""


class EngineError(Error):
    """The engine could not start or could not recognise the page."""


class NoRecognizerError(Error):
    """No text recogniser is available (no language data is installed)."""


class RecognitionTimeoutError(Error, TimeoutError):
    """The recognition ran past its deadline (the ``timeout`` given, or the engine's)."""


class RecognitionCancelledError(Error, concurrent.futures.CancelledError):
    """The recognition was stopped while it ran."""


class UnsupportedSystemError(NoRecognizerError):
    """The job found no text recognition on this system (the job's own error)."""


_KINDS = {
    (RECOGNITION_DOMAIN, _native.ERROR_IMAGE_UNREADABLE): ImageUnreadableError,
    (RECOGNITION_DOMAIN, _native.ERROR_UNSUPPORTED_LANGUAGE): UnsupportedLanguageError,
    (RECOGNITION_DOMAIN, _native.ERROR_ENGINE_FAILURE): EngineError,
    (RECOGNITION_DOMAIN, _native.ERROR_NO_RECOGNIZER): NoRecognizerError,
    (RECOGNITION_DOMAIN, _native.ERROR_TIMED_OUT): RecognitionTimeoutError,
    (RECOGNITION_DOMAIN, _native.ERROR_CANCELLED): RecognitionCancelledError,
    (OCR_DOMAIN, _native.ERROR_UNSUPPORTED_SYSTEM): UnsupportedSystemError,
    (DOCUMENT_DOMAIN, _native.ERROR_DOCUMENT_UNREADABLE): DocumentUnreadableError,
    (DOCUMENT_DOMAIN, _native.ERROR_DOCUMENT_DAMAGED): DocumentDamagedError,
    (DOCUMENT_DOMAIN, _native.ERROR_DOCUMENT_ENCRYPTED): DocumentEncryptedError,
    (DOCUMENT_DOMAIN, _native.ERROR_PAGE_RANGE): PageRangeError,
    (DOCUMENT_DOMAIN, _native.ERROR_WRITE): WriteError,
}


def error_from(domain: str, code: int, reason: str, description: str = "") -> Error:
    """The exception for an error the library reported; a kind this module does not know
    is a plain :class:`Error`."""
    return _KINDS.get((domain, code), Error)(domain, code, reason, description)


def _rebuild(domain: str, code: int, reason: str, description: str) -> Error:
    return error_from(domain, code, reason, description)
