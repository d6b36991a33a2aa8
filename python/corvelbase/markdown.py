"""Markdown editing commands for a plain-text editor.

Each command takes the editor's whole text and its selection, as ``(start, end)`` indexes
into the Python string, and answers with an :class:`Edit`: the text to put in place of a
span of the text and, for the list and prefix commands, the span to select afterwards.
Selections beyond the text are clamped to it. The text itself is never changed::

    >>> from corvelbase import markdown
    >>> edit = markdown.set_header("Title\\nbody\\n", 2, (0, 5))
    >>> edit.apply("Title\\nbody\\n")[0]
    '## Title\\nbody\\n'

Commands work on the lines the selection touches; a line ends after its line feed.
"""
from __future__ import annotations

from dataclasses import dataclass

from . import _corvelbase as _native

Span = tuple[int, int]


@dataclass(frozen=True, slots=True)
class Edit:
    """Put ``text`` in place of ``replace`` (a span of the old text); then select
    ``select`` (a span of the new text), when the command gives one."""

    text: str
    replace: Span
    select: Span | None = None

    def apply(self, text: str) -> tuple[str, Span | None]:
        """The edited text and the span to select in it."""
        start, end = self.replace
        return text[:start] + self.text + text[end:], self.select


@dataclass(frozen=True, slots=True)
class Line:
    """A line the selection touches: its text with its line feed, and its span."""

    text: str
    start: int
    end: int


def _edit(raw: tuple | None) -> Edit | None:
    return None if raw is None else Edit(*raw)


def _span(selection: Span) -> tuple[int, int]:
    start, end = selection
    return max(0, start), max(0, end)


def lines(text: str, selection: Span) -> list[Line]:
    """The lines the selection touches. A caret at the end of a text ending with a line
    feed touches one empty line at the caret."""
    return [Line(*line) for line in _native.md_lines(text, *_span(selection))]


def find_link(text: str, selection: Span) -> tuple[Span, Span | None] | None:
    """The span of a ``[text](url)`` link on the selection's first line that covers the
    selection, with the span of its text, or None."""
    return _native.md_find_link(text, *_span(selection))


def link(text: str, selection: Span, url: str) -> Edit:
    """Makes the selected text a link to ``url``."""
    return _edit(_native.md_link(text, *_span(selection), url))


def header_prefix(level: int) -> str:
    """The prefix of a header of that level: ``"## "`` for 2, ``""`` for 0."""
    return _native.md_header_prefix(level)


def set_header(text: str, level: int, selection: Span) -> Edit:
    """Sets the header level of the selection's first line; the level it already has
    removes the header."""
    return _edit(_native.md_set_header(text, *_span(selection), level))


def increment_header(text: str, selection: Span) -> Edit:
    """Raises the header of the selection's first line by one; a sixth level wraps to
    none."""
    return _edit(_native.md_increment_header(text, *_span(selection)))


def toggle_prefix(text: str, prefix: str, selection: Span, *,
                  first_line_only: bool = False) -> Edit:
    """Adds ``prefix`` to each touched line, or removes it from a line that has it."""
    return _edit(_native.md_toggle_prefix(text, *_span(selection), prefix, first_line_only))


def task_list(text: str, selection: Span) -> Edit:
    """Toggles ``- [ ] `` on the touched lines."""
    return _edit(_native.md_task_list(text, *_span(selection)))


def bullet_list(text: str, selection: Span) -> Edit:
    """Toggles ``- `` on the touched lines."""
    return _edit(_native.md_bullet_list(text, *_span(selection)))


def quote(text: str, selection: Span) -> Edit:
    """Toggles ``> `` on the touched lines."""
    return _edit(_native.md_quote(text, *_span(selection)))


def numbered_list(text: str, selection: Span) -> Edit:
    """Numbers the touched lines ``1. ``, ``2. ``, ...; removes the numbers when the first
    touched line has one."""
    return _edit(_native.md_numbered_list(text, *_span(selection)))


def numbered_prefix(line: str) -> Span | None:
    """The span of a line's number prefix (leading white space and ``12. ``), or None."""
    return _native.md_numbered_prefix(line)


def horizontal_line(text: str, selection: Span) -> Edit:
    """Puts ``___`` before the first touched line, or removes a line that is just that."""
    return _edit(_native.md_horizontal_line(text, *_span(selection)))


def inline_code(text: str, selection: Span) -> Edit:
    """Wraps the selection in backticks."""
    return _edit(_native.md_inline_code(text, *_span(selection)))


def code_block(text: str, selection: Span) -> Edit | None:
    """Wraps the selection in a fenced code block."""
    return _edit(_native.md_code_block(text, *_span(selection)))


def table(text: str, selection: Span, rows: int, columns: int) -> Edit:
    """Inserts an empty table of ``rows`` lines (the header line counts) and ``columns``
    cells after the last touched line."""
    return _edit(_native.md_table(text, *_span(selection), rows, columns))


_ALIGNMENTS = {"left": 0, "center": 1, "right": 2}


def alignment_tag(alignment: str) -> str:
    """The opening tag :func:`align` uses: ``'<div align="center">\\n'`` for center."""
    return _native.md_alignment_tag(_alignment(alignment))


def _alignment(alignment: str) -> int:
    if alignment not in _ALIGNMENTS:
        raise ValueError(f"alignment must be left, center or right, not {alignment!r}")
    return _ALIGNMENTS[alignment]


def align(text: str, selection: Span, alignment: str) -> Edit:
    """Wraps the touched lines in ``<div align="...">`` and ``</div>``; ``alignment`` is
    ``"left"``, ``"center"`` or ``"right"``."""
    return _edit(_native.md_align(text, *_span(selection), _alignment(alignment)))
