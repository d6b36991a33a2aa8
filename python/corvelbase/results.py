"""What recognition gives back: a result of pages, each a tree of blocks.

Boxes are normalised to the page, 0 to 1 on both axes, with the origin at the bottom
left and y growing upwards, as the library measures them; :meth:`Box.to_pixels` turns
one into the pixel rectangle an image library expects. Confidences are percentages.
"""
from __future__ import annotations

import enum
from dataclasses import dataclass, field
from typing import Iterator


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
class Block:
    """A column, a paragraph or a line, with the blocks it holds (top to bottom)."""

    text: str
    box: Box
    confidence: float
    level: Level
    children: tuple["Block", ...] = ()

    def walk(self) -> Iterator["Block"]:
        """This block and every block inside it, in reading order."""
        yield self
        for child in self.children:
            yield from child.walk()

    @property
    def lines(self) -> tuple["Block", ...]:
        """The line blocks inside this block (itself, for a line)."""
        return tuple(b for b in self.walk() if b.level == Level.LINE)


@dataclass(frozen=True, slots=True)
class Page:
    """One recognised page: its reading-order text and its block tree."""

    text: str
    #: The columns (or, in the engine's orders, the engine's blocks), in reading order.
    blocks: tuple[Block, ...]
    #: Width and height in pixels of the picture that was read; (0, 0) when unknown.
    size: tuple[float, float] = (0.0, 0.0)

    @property
    def lines(self) -> tuple[Block, ...]:
        """Every line of the page, in reading order."""
        return tuple(line for block in self.blocks for line in block.lines)


@dataclass(frozen=True, slots=True)
class Result:
    """The outcome of one recognition job."""

    text: str
    pages: tuple[Page, ...] = field(default_factory=tuple)

    @property
    def lines(self) -> tuple[Block, ...]:
        """Every line of every page, in reading order."""
        return tuple(line for page in self.pages for line in page.lines)


def block_from_tuple(raw: tuple) -> Block:
    """A block tree from the compiled module's (text, box, confidence, level, children)."""
    text, box, confidence, level, children = raw
    return Block(text, Box(*box), confidence, Level(level),
                 tuple(block_from_tuple(child) for child in children))
