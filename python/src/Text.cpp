// The Markdown commands and the string utilities for Python. Positions cross the
// boundary as indexes into the Python string (code points) and are turned into UTF-16
// units and back here, so that Python callers slice their own strings with them.
#include <pybind11/stl.h>

#include <functional>
#include <optional>

#include "Corvelbase/AsianCharacters.h"
#include "Corvelbase/Email.h"
#include "Corvelbase/Language.h"
#include "Corvelbase/MarkdownCommands.h"
#include "Glue.h"

namespace corvel::python {

namespace {

namespace md = MarkdownCommands;

// A selection (start, end) in code points, clamped to the text, as UTF-16 units.
Range selectionUnits(py::handle text, py::ssize_t start, py::ssize_t end) {
  if (end < start) throw py::value_error("a selection ends before it starts");
  std::uint64_t from = unitOffset(text, start);
  return Range{from, unitOffset(text, end) - from};
}

py::tuple spanOf(py::handle text, Range range) {
  py::ssize_t start = indexOfUnit(text, range.location);
  return py::make_tuple(start, indexOfUnit(text, range.location + range.length));
}

std::uint64_t unitLength(const String& text) { return text.size(); }

// A position in the text after the edit (replacement in place of `replaced`) as an
// index into that text, computed from its three pieces without building it.
py::ssize_t indexAfterEdit(py::handle text, const Range& replaced, py::handle replacement,
                           std::uint64_t replacementUnits, std::uint64_t unit) {
  py::ssize_t before = indexOfUnit(text, replaced.location);
  if (unit <= replaced.location) return indexOfUnit(text, unit);
  unit -= replaced.location;
  auto replacementLength = py::len(replacement);
  if (unit <= replacementUnits) {
    return before + indexOfUnit(replacement, unit);
  }
  unit -= replacementUnits;
  py::ssize_t after = indexOfUnit(text, replaced.location + replaced.length);
  return before + static_cast<py::ssize_t>(replacementLength) +
         (indexOfUnit(text, replaced.location + replaced.length + unit) - after);
}

using Command = std::function<std::optional<String>(const String& text, Range selection,
                                                    Range* replaced, Range* selected)>;

// Runs a command and answers (replacement, (start, end) replaced, (start, end) to select
// or None), or None when the command gives nothing. A command that writes no
// replacement range replaces the (clamped) selection.
py::object edit(const py::str& text, py::ssize_t start, py::ssize_t end, bool selects,
                const Command& command) {
  String units = toString(text);
  Range selection = selectionUnits(text, start, end);
  Range replaced = selection, selected = NotFoundRange;
  std::optional<String> out;
  {
    py::gil_scoped_release release;
    out = command(units, selection, &replaced, selects ? &selected : nullptr);
  }
  if (!out) return py::none();
  py::str replacement = fromString(*out);
  py::object select = py::none();
  if (selects && selected.location != NotFound) {
    auto at = [&](std::uint64_t unit) {
      return indexAfterEdit(text, replaced, replacement, unitLength(*out), unit);
    };
    select = py::make_tuple(at(selected.location), at(selected.location + selected.length));
  }
  return py::make_tuple(replacement, spanOf(text, replaced), select);
}

template <typename F>
void defineEdit(py::module_& m, const char* name, bool selects, F command) {
  m.def(name, [selects, command](const py::str& text, py::ssize_t start, py::ssize_t end) {
    return edit(text, start, end, selects, command);
  });
}

std::optional<String> orNone(const std::optional<String>& value) { return value; }

py::object optionalString(const std::optional<String>& value) {
  return value ? py::object(fromString(*value)) : py::object(py::none());
}

}  // namespace

void bindText(py::module_& m) {
  m.def("md_lines", [](const py::str& text, py::ssize_t start, py::ssize_t end) {
    auto items = md::linesForRange(toString(text), selectionUnits(text, start, end));
    py::list out;
    for (const auto& item : items) {
      py::tuple span = spanOf(text, item.range);
      out.append(py::make_tuple(fromString(item.line), span[0], span[1]));
    }
    return out;
  });
  m.def("md_find_link", [](const py::str& text, py::ssize_t start, py::ssize_t end) -> py::object {
    Range link = NotFoundRange, inner = NotFoundRange;
    if (!md::lineContainsMarkdownLink(toString(text), selectionUnits(text, start, end), &link,
                                      &inner)) {
      return py::none();
    }
    return py::make_tuple(spanOf(text, link), inner.location == NotFound
                                                  ? py::object(py::none())
                                                  : py::object(spanOf(text, inner)));
  });
  m.def("md_link", [](const py::str& text, py::ssize_t start, py::ssize_t end, const py::str& url) {
    String target = toString(url);
    return edit(text, start, end, false, [&](const String& t, Range r, Range*, Range*) {
      return orNone(md::insertMarkdownLink(t, target, r));
    });
  });
  m.def("md_header_prefix",
        [](std::uint64_t level) { return fromString(md::headerForLevel(String(), level)); });
  m.def("md_set_header",
        [](const py::str& text, py::ssize_t start, py::ssize_t end, std::uint64_t level) {
          return edit(text, start, end, false, [&](const String& t, Range r, Range* rep, Range*) {
            return orNone(md::setMarkdownHeaderLevel(t, level, r, rep));
          });
        });
  defineEdit(m, "md_increment_header", false, [](const String& t, Range r, Range* rep, Range*) {
    return orNone(md::incrementMarkdownHeader(t, r, rep));
  });
  m.def("md_toggle_prefix", [](const py::str& text, py::ssize_t start, py::ssize_t end,
                               const py::str& prefix, bool firstLineOnly) {
    String p = toString(prefix);
    return edit(text, start, end, true, [&](const String& t, Range r, Range* rep, Range* sel) {
      return orNone(md::insertAtStartOfLine(t, p, r, firstLineOnly, rep, sel));
    });
  });
  defineEdit(m, "md_task_list", true, [](const String& t, Range r, Range* rep, Range* sel) {
    return orNone(md::insertTaskList(t, r, rep, sel));
  });
  defineEdit(m, "md_bullet_list", true, [](const String& t, Range r, Range* rep, Range* sel) {
    return orNone(md::insertUnorderedList(t, r, rep, sel));
  });
  defineEdit(m, "md_quote", true, [](const String& t, Range r, Range* rep, Range* sel) {
    return orNone(md::insertQuote(t, r, rep, sel));
  });
  defineEdit(m, "md_numbered_list", true, [](const String& t, Range r, Range* rep, Range* sel) {
    return orNone(md::insertNumberedList(t, r, rep, sel));
  });
  defineEdit(m, "md_horizontal_line", false, [](const String& t, Range r, Range* rep, Range*) {
    return orNone(md::insertHorizontalLine(t, r, rep));
  });
  defineEdit(m, "md_inline_code", false, [](const String& t, Range r, Range*, Range*) {
    return orNone(md::insertInlineCodeBlock(t, r));
  });
  defineEdit(m, "md_code_block", false, [](const String& t, Range r, Range* rep, Range*) {
    return md::insertCodeBlock(t, r, rep);
  });
  m.def("md_table", [](const py::str& text, py::ssize_t start, py::ssize_t end, std::uint64_t rows,
                       std::uint64_t columns) {
    return edit(text, start, end, false, [&](const String& t, Range r, Range* rep, Range*) {
      return orNone(md::insertTable(t, r, rows, columns, rep));
    });
  });
  m.def("md_align",
        [](const py::str& text, py::ssize_t start, py::ssize_t end, std::int64_t alignment) {
          return edit(text, start, end, false, [&](const String& t, Range r, Range* rep, Range*) {
            return orNone(md::insertHTMLJustity(t, alignment, r, rep));
          });
        });
  m.def("md_alignment_tag",
        [](std::int64_t alignment) { return fromString(md::justifyString(String(), alignment)); });
  m.def("md_numbered_prefix", [](const py::str& line) -> py::object {
    Range range;
    if (!md::containsNumberedList(toString(line), &range)) return py::none();
    return spanOf(line, range);
  });

  m.def("dominant_language", [](const py::str& text) -> std::optional<std::string> {
    String units = toString(text);
    py::gil_scoped_release release;
    return Language::dominantLanguage(units);
  });
  m.def("header_value", [](const py::str& message, const py::str& field, bool address) {
    String text = toString(message), name = toString(field);
    std::optional<String> value;
    {
      py::gil_scoped_release release;
      value = Email::headerValueForField(text, name, address);
    }
    return optionalString(value);
  });
  m.def("contains_asian_characters", [](const py::str& text) {
    return AsianCharacters::containsAsianCharacters(toString(text));
  });
}

}  // namespace corvel::python
