"""Type identifiers: what kind of file a path is, conformance between types, extensions
and MIME types, and the identifiers of the application's own item kinds.

Identifiers are reverse-DNS strings (``"public.jpeg"``), compared without regard to case.
The tests :func:`conforms_to` and :func:`equal` count Finder clippings as the unknown
item kind, as the application's own code does.
"""
from __future__ import annotations

import os
from dataclasses import dataclass
from typing import Iterable

from . import _corvelbase as _native

# The application's item kinds, and outside formats with no public constant.
RVMX_DATABASE: str = _native.TYPE_CONSTANTS["RVMX_DATABASE"]
RVMX_GROUP: str = _native.TYPE_CONSTANTS["RVMX_GROUP"]
RVMX_SHEET: str = _native.TYPE_CONSTANTS["RVMX_SHEET"]
RVMX_SMART_GROUP: str = _native.TYPE_CONSTANTS["RVMX_SMART_GROUP"]
RVMX_PLACEHOLDER: str = _native.TYPE_CONSTANTS["RVMX_PLACEHOLDER"]
RVMX_FEED: str = _native.TYPE_CONSTANTS["RVMX_FEED"]
RVMX_FORMATTED_NOTE: str = _native.TYPE_CONSTANTS["RVMX_FORMATTED_NOTE"]
RVMX_UNKNOWN: str = _native.TYPE_CONSTANTS["RVMX_UNKNOWN"]
MARKDOWN: str = _native.TYPE_CONSTANTS["MARKDOWN"]
APPLE_MAIL: str = _native.TYPE_CONSTANTS["APPLE_MAIL"]
WEB_INTERNET_LOCATION: str = _native.TYPE_CONSTANTS["WEB_INTERNET_LOCATION"]
TEXTBUNDLE: str = _native.TYPE_CONSTANTS["TEXTBUNDLE"]
COMPRESSED_TEXTBUNDLE: str = _native.TYPE_CONSTANTS["COMPRESSED_TEXTBUNDLE"]
HEIC: str = _native.TYPE_CONSTANTS["HEIC"]
URL_NAME: str = _native.TYPE_CONSTANTS["URL_NAME"]

__all__ = sorted(_native.TYPE_CONSTANTS) + [
    "of_file", "for_extension", "for_mime_type", "preferred_extension",
    "preferred_mime_type", "supertypes", "conforms_to", "equal", "is_dynamic", "is_rtf_kind",
    "Declaration", "declaration", "declare", "load_declarations",
]


def of_file(path: str | os.PathLike[str]) -> str | None:
    """The type of a file by its extension (folders and packages too), or None when the
    path does not exist."""
    return _native.type_of_file(os.fsencode(path))


def for_extension(extension: str) -> str:
    """The type a filename extension (without the dot) stands for; a ``dyn.`` identifier
    when no declared type claims it."""
    return _native.type_for_extension(extension)


def for_mime_type(mime_type: str) -> str:
    """The type a MIME type stands for; a ``dyn.`` identifier when none claims it."""
    return _native.type_for_mime_type(mime_type)


def preferred_extension(type_: str) -> str | None:
    return _native.type_preferred_extension(type_)


def preferred_mime_type(type_: str) -> str | None:
    return _native.type_preferred_mime_type(type_)


def supertypes(type_: str) -> list[str]:
    """The type itself, then every type it conforms to, nearest first."""
    return _native.type_supertypes(type_)


def conforms_to(type_: str, parent: str) -> bool:
    return _native.uti_conforms_to(type_, parent)


def equal(type_: str, other: str) -> bool:
    return _native.uti_equal(type_, other)


def is_dynamic(type_: str) -> bool:
    return _native.uti_is_dynamic(type_)


def is_rtf_kind(type_: str) -> bool:
    """True for RTF and RTFD themselves, not for types that conform to them."""
    return _native.uti_is_rtf_kind(type_)


@dataclass(frozen=True, slots=True)
class Declaration:
    """A type as declared: its parents, extensions and MIME types (preferred first)."""

    identifier: str
    conforms_to: tuple[str, ...]
    extensions: tuple[str, ...]
    mime_types: tuple[str, ...]
    description: str


def declaration(type_: str) -> Declaration | None:
    """The declaration of a type, or None when it is not declared."""
    raw = _native.type_declaration(type_)
    if raw is None:
        return None
    identifier, parents, extensions, mime_types, description = raw
    return Declaration(identifier, tuple(parents), tuple(extensions), tuple(mime_types),
                       description)


def declare(identifier: str, *, conforms_to: Iterable[str] = (), extensions: Iterable[str] = (),
            mime_types: Iterable[str] = (), description: str = "") -> bool:
    """Declares a type for this process (or replaces its declaration)."""
    return _native.type_declare(identifier, list(conforms_to), list(extensions),
                                list(mime_types), description)


def load_declarations(path: str | os.PathLike[str]) -> int | None:
    """Declares the types of a property list (an application's Info.plist or a bare
    array of declarations); the number declared, or None when it cannot be read."""
    return _native.type_load_declarations(os.fsencode(path))
