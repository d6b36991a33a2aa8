// corvel md: the Markdown editing commands for editors written in any language. Reads a
// UTF-8 document, runs one command on a selection and prints the result as one JSON object
// (ranges in UTF-16 units, as the library counts), or with --apply the edited document.
#include <algorithm>
#include <charconv>
#include <climits>
#include <functional>
#include <iostream>
#include <iterator>
#include <map>
#include <nlohmann/json.hpp>
#include <optional>
#include <set>

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Files.h"
#include "tools/corvel/Commands.h"
#include "tools/corvel/TextInput.h"

namespace corvel::tool {

namespace {

namespace md = corvel::MarkdownCommands;
using json = nlohmann::ordered_json;  // keys in the order documented

// What the command line gave, parsed.
struct Options {
  std::string command;
  std::optional<Range> selection;
  std::optional<std::uint64_t> level, rows, columns;
  std::optional<std::int64_t> alignment;
  std::optional<std::string> url, prefix, file;
  bool firstLineOnly = false;
  bool apply = false;
};

// The answer of an editing command: the text (nullopt for nil), the ranges it wrote and
// the range the editor replaces.
struct Edit {
  std::optional<String> text;
  std::optional<Range> replacementRange;
  std::optional<Range> selectionRange;
  Range replaces;
};

struct Context {
  const Options& options;
  const String& document;
  Range selection;
};

using EditFunction = std::function<Edit(const Context&)>;

// Commands that answer with text to put in place of a range; the set names the options
// each one needs besides --selection.
struct EditCommand {
  std::set<std::string> options;
  EditFunction run;
};

template <typename F>
Edit withBothRanges(const Context& c, F command) {
  Range replaced, selected;
  String text = command(c.document, c.selection, &replaced, &selected);
  return Edit{text, replaced, selected, replaced};
}

template <typename F>
Edit withReplacement(F command) {
  Range replaced;
  std::optional<String> text = command(&replaced);
  return Edit{text, replaced, std::nullopt, replaced};
}

const std::map<std::string, EditCommand>& editCommands() {
  static const std::map<std::string, EditCommand> table = {
      {"insertTaskList",
       {{}, [](const Context& c) { return withBothRanges(c, md::insertTaskList); }}},
      {"insertUnorderedList",
       {{}, [](const Context& c) { return withBothRanges(c, md::insertUnorderedList); }}},
      {"insertQuote", {{}, [](const Context& c) { return withBothRanges(c, md::insertQuote); }}},
      {"insertNumberedList",
       {{}, [](const Context& c) { return withBothRanges(c, md::insertNumberedList); }}},
      {"insertAtStartOfLine",
       {{"--prefix", "--first-line-only"},
        [](const Context& c) {
          Range replaced, selected;
          String text =
              md::insertAtStartOfLine(c.document, fromUTF8(*c.options.prefix), c.selection,
                                      c.options.firstLineOnly, &replaced, &selected);
          return Edit{text, replaced, selected, replaced};
        }}},
      {"insertHorizontalLine",
       {{},
        [](const Context& c) {
          return withReplacement([&](Range* r) {
            return std::optional<String>(md::insertHorizontalLine(c.document, c.selection, r));
          });
        }}},
      {"setMarkdownHeaderLevel",
       {{"--level"},
        [](const Context& c) {
          return withReplacement([&](Range* r) {
            return std::optional<String>(
                md::setMarkdownHeaderLevel(c.document, *c.options.level, c.selection, r));
          });
        }}},
      {"incrementMarkdownHeader",
       {{},
        [](const Context& c) {
          return withReplacement([&](Range* r) {
            return std::optional<String>(md::incrementMarkdownHeader(c.document, c.selection, r));
          });
        }}},
      {"insertCodeBlock",
       {{},
        [](const Context& c) {
          return withReplacement(
              [&](Range* r) { return md::insertCodeBlock(c.document, c.selection, r); });
        }}},
      {"insertTable",
       {{"--rows", "--columns"},
        [](const Context& c) {
          return withReplacement([&](Range* r) {
            return std::optional<String>(
                md::insertTable(c.document, c.selection, *c.options.rows, *c.options.columns, r));
          });
        }}},
      {"insertHTMLJustity",
       {{"--alignment"},
        [](const Context& c) {
          return withReplacement([&](Range* r) {
            return std::optional<String>(
                md::insertHTMLJustity(c.document, *c.options.alignment, c.selection, r));
          });
        }}},
      // These two write no range: the editor replaces its selection.
      {"insertMarkdownLink",
       {{"--url"},
        [](const Context& c) {
          String text = md::insertMarkdownLink(c.document, fromUTF8(*c.options.url), c.selection);
          return Edit{text, std::nullopt, std::nullopt, c.selection};
        }}},
      {"insertInlineCodeBlock",
       {{},
        [](const Context& c) {
          return Edit{md::insertInlineCodeBlock(c.document, c.selection), std::nullopt,
                      std::nullopt, c.selection};
        }}},
  };
  return table;
}

// Commands that edit nothing: they answer a question or build a fragment.
const std::set<std::string> kQueryCommands = {"linesForRange", "lineContainsMarkdownLink",
                                              "containsNumberedList", "headerForLevel",
                                              "justifyString"};

json rangeJSON(std::optional<Range> range) {
  if (!range) return nullptr;
  return json::array({range->location, range->length});
}

json textJSON(const std::optional<String>& text) {
  if (!text) return nullptr;
  return toUTF8(*text);
}

template <typename T>
bool parseNumber(const std::string& s, T& out) {
  auto [end, error] = std::from_chars(s.data(), s.data() + s.size(), out);
  return error == std::errc() && end == s.data() + s.size() && !s.empty();
}

bool parseRange(const std::string& s, Range& out) {
  auto comma = s.find(',');
  if (comma == std::string::npos) return false;
  return parseNumber(s.substr(0, comma), out.location) &&
         parseNumber(s.substr(comma + 1), out.length);
}

// Parses the arguments; on misuse returns the message.
std::optional<std::string> parse(const Arguments& args, Options& o) {
  if (args.empty()) return "md needs a COMMAND";
  o.command = args[0];
  for (std::size_t i = 1; i < args.size(); ++i) {
    const std::string& a = args[i];
    if (a == "--apply") {
      o.apply = true;
      continue;
    }
    if (a == "--first-line-only") {
      o.firstLineOnly = true;
      continue;
    }
    if (a.rfind("--", 0) != 0) {
      if (o.file) return "more than one document given";
      o.file = a;
      continue;
    }
    if (i + 1 >= args.size()) return "option " + a + " needs a value";
    const std::string& v = args[++i];
    bool ok = true;
    if (a == "--selection") {
      Range r;
      ok = parseRange(v, r);
      o.selection = r;
    } else if (a == "--level") {
      o.level.emplace();
      ok = parseNumber(v, *o.level);
    } else if (a == "--rows") {
      o.rows.emplace();
      ok = parseNumber(v, *o.rows);
    } else if (a == "--columns") {
      o.columns.emplace();
      ok = parseNumber(v, *o.columns);
    } else if (a == "--alignment") {
      // The names a user means; the numbers the library takes (1 center, 2 right, any
      // other left) are accepted as they were.
      static const std::map<std::string, std::int64_t> kAlignments = {
          {"left", 0}, {"center", 1}, {"centre", 1}, {"right", 2}};
      if (auto it = kAlignments.find(v); it != kAlignments.end()) {
        o.alignment = it->second;
      } else {
        o.alignment.emplace();
        if (!parseNumber(v, *o.alignment)) {
          return "--alignment takes left, center, right (or 0, 1, 2), not '" + v + "'";
        }
      }
    } else if (a == "--url") {
      o.url = v;
    } else if (a == "--prefix") {
      o.prefix = v;
    } else {
      return "unknown option " + a;
    }
    if (!ok) return "bad value '" + v + "' for " + a;
  }
  return std::nullopt;
}

// The options a command may take besides the ones every command takes.
std::set<std::string> allowedOptions(const std::string& command) {
  if (auto it = editCommands().find(command); it != editCommands().end()) return it->second.options;
  if (command == "headerForLevel") return {"--level"};
  if (command == "justifyString") return {"--alignment"};
  return {};
}

std::optional<std::string> checkOptions(const Options& o) {
  std::set<std::string> allowed = allowedOptions(o.command);
  std::map<std::string, bool> given = {
      {"--level", o.level.has_value()},      {"--rows", o.rows.has_value()},
      {"--columns", o.columns.has_value()},  {"--alignment", o.alignment.has_value()},
      {"--url", o.url.has_value()},          {"--prefix", o.prefix.has_value()},
      {"--first-line-only", o.firstLineOnly}};
  for (const auto& [name, present] : given) {
    bool optional = name == "--first-line-only";
    if (present && !allowed.count(name))
      return "option " + name + " does not apply to " + o.command;
    if (!present && !optional && allowed.count(name)) return o.command + " needs " + name;
  }
  bool needsDocument = o.command != "headerForLevel" && o.command != "justifyString";
  if (needsDocument && !o.selection && o.command != "containsNumberedList")
    return o.command + " needs --selection LOC,LEN";
  if (o.apply && !editCommands().count(o.command))
    return "--apply does not apply to " + o.command + ": it edits nothing";
  return std::nullopt;
}

int runQuery(const Options& o, const String& document) {
  json out;
  const Range selection = o.selection.value_or(Range{});
  if (o.command == "headerForLevel") {
    out = {{"text", toUTF8(md::headerForLevel(document, *o.level))},
           {"replacementRange", nullptr},
           {"selectionRange", nullptr}};
  } else if (o.command == "justifyString") {
    out = {{"text", toUTF8(md::justifyString(document, *o.alignment))},
           {"replacementRange", nullptr},
           {"selectionRange", nullptr}};
  } else if (o.command == "linesForRange") {
    json items = json::array();
    for (const md::LineItem& item : md::linesForRange(document, selection))
      items.push_back({{std::string(md::kLineItemLineKey), toUTF8(item.line)},
                       {std::string(md::kLineItemRangeKey), rangeJSON(item.range)}});
    out = {{"lines", items}};
  } else if (o.command == "lineContainsMarkdownLink") {
    Range link = NotFoundRange;
    std::optional<Range> text;
    Range textRange = NotFoundRange;  // stays so when no "](" was seen
    bool found = md::lineContainsMarkdownLink(document, selection, &link, &textRange);
    if (textRange.location != NotFound) text = textRange;
    out = {{"result", found}, {"linkRange", rangeJSON(link)}, {"textRange", rangeJSON(text)}};
  } else {  // containsNumberedList: the document is the line
    Range number;
    bool found = md::containsNumberedList(document, &number);
    out = {{"result", found}, {"range", found ? rangeJSON(number) : json(nullptr)}};
  }
  std::cout << out.dump() << '\n';
  return 0;
}

int runEdit(const Options& o, const String& document) {
  const EditCommand& command = editCommands().at(o.command);
  Edit edit = command.run(Context{o, document, *o.selection});
  if (o.apply) {
    if (!edit.text) {
      std::cout << toUTF8(document);
      return 1;
    }
    String edited = document;
    edited.replace(static_cast<std::size_t>(edit.replaces.location),
                   static_cast<std::size_t>(edit.replaces.length), *edit.text);
    std::cout << toUTF8(edited);
    return 0;
  }
  json out = {{"text", textJSON(edit.text)},
              {"replacementRange", rangeJSON(edit.replacementRange)},
              {"selectionRange", rangeJSON(edit.selectionRange)}};
  std::cout << out.dump() << '\n';
  return 0;
}

std::vector<std::string> commandNames() {
  std::vector<std::string> names;
  for (const auto& [name, command] : editCommands()) names.push_back(name);
  names.insert(names.end(), kQueryCommands.begin(), kQueryCommands.end());
  std::sort(names.begin(), names.end());
  return names;
}

int run(const Arguments& args) {
  if (args.size() == 1 && args[0] == "--list") {
    for (const auto& name : commandNames()) std::cout << name << '\n';
    return 0;
  }
  Options o;
  if (auto error = parse(args, o)) return misuse("md: " + *error);
  if (!editCommands().count(o.command) && !kQueryCommands.count(o.command)) {
    return misuse("md: unknown Markdown command '" + o.command + "'" +
                  didYouMean(o.command, commandNames()) + "; corvel md --list names them");
  }
  if (auto error = checkOptions(o)) return misuse("md: " + *error);

  String document;
  if (o.command != "headerForLevel" && o.command != "justifyString") {
    std::optional<String> read = readTextInput("md", o.file.value_or(""));
    if (!read) return 2;
    document = std::move(*read);
  }
  if (o.selection) {
    const Range s = *o.selection;
    if (s.location > document.size() || s.length > document.size() - s.location)
      return misuse("selection " + std::to_string(s.location) + "," + std::to_string(s.length) +
                    " lies outside the document (" + std::to_string(document.size()) +
                    " UTF-16 units)");
  }
  if (kQueryCommands.count(o.command)) return runQuery(o, document);
  return runEdit(o, document);
}

CommandRegistration reg("md",
                        "md COMMAND --selection LOC,LEN [--level N] [--url U] [--rows R --columns "
                        "C] [--alignment left|center|right] [--prefix P [--first-line-only]] "
                        "[--apply] [FILE] | md --list : runs a Markdown editing command on a UTF-8 "
                        "document (FILE or standard input, -) and prints its result as JSON, or "
                        "the edited document; --list names the commands",
                        &run, "--apply --first-line-only --list");

}  // namespace

}  // namespace corvel::tool
