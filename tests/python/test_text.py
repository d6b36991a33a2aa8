# The Markdown commands and string utilities through the module. Spans are indexes into
# Python strings; the command-line tool answers in UTF-16 units, so comparing the two
# checks the conversion both ways, past characters that take two units.
import json
import subprocess

import pytest

import corvelbase
from corvelbase import markdown, uti

TEXT = "😀 intro\n😀😀 second line\nthird\n"


def utf16(text, index):
    return len(text[:index].encode("utf-16-le")) // 2


def tool_edit(tool, tmp_path, command, selection, *options):
    document = tmp_path / "doc.md"
    document.write_text(TEXT)
    start, end = utf16(TEXT, selection[0]), utf16(TEXT, selection[1])
    out = subprocess.run([tool, "md", command, "--selection", f"{start},{end - start}",
                          *options, str(document)], check=True, capture_output=True, text=True)
    return json.loads(out.stdout)


@pytest.mark.parametrize("command, call, options", [
    ("insertTaskList", markdown.task_list, ()),
    ("insertUnorderedList", markdown.bullet_list, ()),
    ("insertQuote", markdown.quote, ()),
    ("insertNumberedList", markdown.numbered_list, ()),
    ("incrementMarkdownHeader", markdown.increment_header, ()),
    ("insertInlineCodeBlock", markdown.inline_code, ()),
    ("insertCodeBlock", markdown.code_block, ()),
    ("setMarkdownHeaderLevel", lambda t, s: markdown.set_header(t, 3, s), ("--level", "3")),
    ("insertTable", lambda t, s: markdown.table(t, s, 2, 3), ("--rows", "2", "--columns", "3")),
    ("insertHTMLJustity", lambda t, s: markdown.align(t, s, "right"), ("--alignment", "2")),
    ("insertMarkdownLink", lambda t, s: markdown.link(t, s, "https://x.org/ü"),
     ("--url", "https://x.org/ü")),
])
@pytest.mark.parametrize("selection", [(12, 14), (5, 30)])
def test_commands_answer_as_the_command_line_does(corvel_tool, tmp_path, command, call,
                                                  options, selection):
    edit = call(TEXT, selection)
    expected = tool_edit(corvel_tool, tmp_path, command, selection, *options)
    assert edit.text == expected["text"]
    replaced = expected.get("replacementRange") or [utf16(TEXT, selection[0]),
                                                     utf16(TEXT, selection[1])
                                                     - utf16(TEXT, selection[0])]
    start, end = edit.replace
    assert [utf16(TEXT, start), utf16(TEXT, end) - utf16(TEXT, start)] == replaced
    edited, select = edit.apply(TEXT)
    if expected.get("selectionRange") is not None:
        a, b = select
        assert [utf16(edited, a), utf16(edited, b) - utf16(edited, a)] == \
            expected["selectionRange"]


def test_line_and_link_queries_use_python_indexes():
    text = "😀 see [the site](http://a.b) now\nnext"
    first, second = text.split("\n")
    assert [(line.text, line.start, line.end) for line in markdown.lines(text, (3, 40))] == \
        [(first + "\n", 0, len(first) + 1), (second, len(first) + 1, len(text))]
    link, inner = markdown.find_link(text, (10, 10))
    assert text[slice(*link)] == "[the site](http://a.b)" and text[slice(*inner)] == "the site"
    assert markdown.find_link(text, (0, 1)) is None
    assert markdown.numbered_prefix("  12. item") == (0, 6)
    assert markdown.header_prefix(2) == "## "
    with pytest.raises(ValueError):
        markdown.task_list(text, (5, 2))


@pytest.mark.parametrize("call, expected", [
    (lambda: corvelbase.dominant_language(
        "Le musée ouvre ses portes à neuf heures et ferme le soir."), "fr"),
    (lambda: corvelbase.dominant_language(""), None),
    (lambda: corvelbase.header_value("Subject: Hello\nFrom: Ann <ann@x.org>\n", "subject"),
     "Hello"),
    (lambda: corvelbase.header_value("From: Ann <ann@x.org>\n", "From", address=True),
     "ann@x.org"),
    (lambda: corvelbase.header_value("Subject:Hello\n", "Subject"), None),
    (lambda: corvelbase.contains_asian_characters("かな"), True),
    (lambda: corvelbase.contains_asian_characters("한국어"), False),
    (lambda: uti.for_extension("PNG"), "public.png"),
    (lambda: uti.conforms_to("public.png", "public.image"), True),
    (lambda: uti.equal("com.apple.finder.textclipping", uti.RVMX_UNKNOWN), True),
    (lambda: uti.is_rtf_kind("com.apple.rtfd"), True),
    (lambda: uti.supertypes("public.png")[:2], ["public.png", "public.image"]),
    (lambda: uti.preferred_mime_type(uti.MARKDOWN), "text/markdown"),
    (lambda: corvelbase.is_valid_language_combination(["ja-JP", "en-US"]), True),
    (lambda: corvelbase.is_valid_language_combination(["en-US"]), False),
    (lambda: corvelbase.order_languages(["en-US", "ko-KR", "ja-JP"]),
     ["ko-KR", "en-US", "ja-JP"]),
], ids=lambda value: "" if callable(value) else None)
def test_string_utilities(call, expected):
    assert call() == expected


def test_types_of_files_and_declarations(tmp_path):
    assert uti.of_file(tmp_path / "missing.png") is None
    (tmp_path / "a.png").write_bytes(b"")
    assert uti.of_file(tmp_path / "a.png") == "public.png"
    assert uti.declare("org.example.notes", conforms_to=["public.plain-text"],
                       extensions=["notes"])
    assert uti.for_extension("notes") == "org.example.notes"
    assert uti.declaration("org.example.notes").conforms_to == ("public.plain-text",)


def test_language_catalogue():
    languages = {language.code: language for language in corvelbase.languages()}
    assert len(languages) == 14 and languages["en-US"].installed
    assert languages["yue-Hans"].iso_code == "zh-Hans"
    assert languages["ja-JP"].force_primary and languages["ja-JP"].secondary == ("en-US",)
    assert not languages["zh-Hans"].fast
