"""What recognition gives back: a result of pages, each a tree of blocks whose lines hold
their words, and the writers of the output formats.

Boxes are normalised to the page, 0 to 1 on both axes, with the origin at the bottom
left and y growing upwards, as the library measures them; :meth:`Box.to_pixels` turns
one into the pixel rectangle an image library expects. Confidences are percentages.
"""
from __future__ import annotations

import enum
import os
from dataclasses import dataclass, field
from typing import Any, Iterable, Iterator

from . import _corvelbase as _native
from .errors import Error, error_from


class Level(enum.IntEnum):
    """How much of the page a block is."""

    COLUMN = 0
    PARAGRAPH = 1
    LINE = 2


@dataclass(frozen=True, slots=True)
class Box:
    """A rectangle normalised to the page, origin at the bottom left."""

    x: float
    y: float
    width: float
    height: float

    def to_pixels(self, width: float, height: float) -> tuple[int, int, int, int]:
        """(left, top, right, bottom) in pixels of a page of that size, origin at the top
        left, widened to whole pixels."""
        import math

        left = math.floor(self.x * width)
        right = math.ceil((self.x + self.width) * width)
        top = math.floor((1 - self.y - self.height) * height)
        bottom = math.ceil((1 - self.y) * height)
        return left, top, right, bottom


@dataclass(frozen=True, slots=True)
class Word:
    """One word of a line."""

    text: str
    box: Box
    confidence: float


@dataclass(frozen=True, slots=True)
class Block:
    """A column, a paragraph or a line, with the blocks it holds (top to bottom). A line
    holds its words, left to right; in the ``rows`` order a line may be a row whose
    children are the lines read across it."""

    text: str
    box: Box
    confidence: float
    level: Level
    children: tuple["Block", ...] = ()
    words: tuple[Word, ...] = ()

    def walk(self) -> Iterator["Block"]:
        """This block and every block inside it, in reading order."""
        yield self
        for child in self.children:
            yield from child.walk()

    @property
    def lines(self) -> tuple["Block", ...]:
        """The lines of the text inside this block (itself, for a line), in reading
        order; a row counts once, not with each line across it."""
        if self.level == Level.LINE:
            return (self,)
        return tuple(line for child in self.children for line in child.lines)


@dataclass(frozen=True, slots=True)
class Page:
    """One page: its reading-order text and its block tree."""

    text: str
    #: The columns (or, in the engine's orders, the engine's blocks), in reading order.
    blocks: tuple[Block, ...]
    #: Width and height in pixels of the picture that was read; (0, 0) when unknown.
    size: tuple[float, float] = (0.0, 0.0)
    #: The page's place in its document, from 0.
    index: int = 0
    #: Pixels per inch of the picture read; 0 when it does not say.
    resolution: float = 0.0
    #: A PDF page that had text of its own, kept as it was (``force_ocr`` reads it):
    #: ``text`` is that text and there are no blocks.
    has_own_text: bool = False
    #: Why the page could not be read (it has no text then), or None.
    error: Error | None = None

    @property
    def lines(self) -> tuple[Block, ...]:
        """Every line of the page, in reading order."""
        return tuple(line for block in self.blocks for line in block.lines)

    @property
    def words(self) -> tuple[Word, ...]:
        """Every word of the page, in reading order."""
        return tuple(word for line in self.lines for word in line.words)


@dataclass(frozen=True, slots=True)
class Result:
    """The outcome of one recognition job: an image's page, or a document's pages."""

    #: The pages' texts, a form feed between pages.
    text: str
    pages: tuple[Page, ...] = field(default_factory=tuple)
    #: The path or URL as given; None for bytes and pixels.
    name: str | None = None
    _outcome: Any = field(default=None, repr=False, compare=False)

    @property
    def lines(self) -> tuple[Block, ...]:
        """Every line of every page, in reading order."""
        return tuple(line for page in self.pages for line in page.lines)

    def save(self, path: str | os.PathLike[str], format: str | None = None) -> None:
        """Writes this result to ``path``; see :func:`write`."""
        write(self, path, format)

    def __reduce__(self):
        # What the writers need stays in the process that read the pages: a result sent
        # to another process (a Dask worker's to its client) keeps its text and pages.
        return (Result, (self.text, self.pages, self.name))


#: The output formats, by name.
FORMATS = ("txt", "json", "hocr", "alto", "tsv", "pdf")


def _outcomes(results: Result | Iterable[Result]) -> list[Any]:
    results = [results] if isinstance(results, Result) else list(results)
    if any(result._outcome is None for result in results):
        raise ValueError("a result received from another process cannot be written; "
                         "write it where it was read")
    return [result._outcome for result in results]


def write(results: Result | Iterable[Result], path: str | os.PathLike[str],
          format: str | None = None) -> None:
    """Writes one result, or several as one document, to ``path`` (atomically: a
    temporary file renamed).

    ``format`` is one of :data:`FORMATS`, or by default the one ``path``'s extension names
    (``.txt``, ``.json``, ``.hocr`` or ``.html``, ``.xml`` or ``.alto``, ``.tsv``, ``.pdf``).
    They are laid out as ``corvel ocr`` writes them: the JSON schema is the README's;
    hOCR, ALTO and TSV as Tesseract lays them out. ``pdf`` is the searchable PDF of one
    result: its source (a PDF keeps everything it had) with the words as invisible text;
    the source file must still be where it was read. Raises
    :class:`~corvelbase.WriteError` when the file cannot be written, and ValueError for
    an unknown format.
    """
    error = _native.write(_outcomes(results), os.fsencode(path), format or "")
    if error is not None:
        raise error_from(*error)


def render(results: Result | Iterable[Result], format: str) -> str:
    """The text :func:`write` would write in a format other than ``pdf``."""
    return _native.render(_outcomes(results), format)


def block_from_tuple(raw: tuple) -> Block:
    """A block tree from the compiled module's (text, box, confidence, level, children,
    words)."""
    text, box, confidence, level, children, words = raw
    return Block(text, Box(*box), confidence, Level(level),
                 tuple(block_from_tuple(child) for child in children),
                 tuple(Word(word, Box(*where), certainty) for word, where, certainty in words))


def page_from_tuple(raw: tuple) -> Page:
    """A page from the compiled module's (index, size, resolution, text, has own text,
    blocks, error)."""
    index, size, resolution, text, own, blocks, error = raw
    return Page(text, tuple(block_from_tuple(block) for block in blocks), size, index,
                resolution, own, error_from(*error) if error is not None else None)
