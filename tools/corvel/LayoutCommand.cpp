// corvel layout FILE [--json | --tree]: our reading order for line boxes from any engine.
//
// FILE holds line blocks in the dictionary form: a JSON array of block dictionaries, or an
// XML or binary property list whose root is such an array ("boundingBox" in the rectangle
// text form "{{x, y}, {w, h}}", normalised, origin bottom-left). The blocks go to a layout
// analyser in file order. Output: the reading-order text; with --json the analysed column
// tree as a JSON array of block dictionaries; with --tree that tree as indented text.
#include <cctype>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <iterator>
#include <nlohmann/json.hpp>
#include <optional>
#include <regex>
#include <string>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/Files.h"
#include "tools/corvel/Commands.h"
#include "tools/corvel/JsonConversion.h"

namespace corvel::tool {

namespace {

using nlohmann::json;

enum class Output { Text, Json, Tree };

// The file's array of block dictionaries, or nullopt with `error` set.
std::optional<PropertyList::Array> readBlockArray(const std::string& path, std::string& error) {
  std::optional<Data> bytes;
  if (path == "-") {
    std::string all((std::istreambuf_iterator<char>(std::cin)), std::istreambuf_iterator<char>());
    if (!std::cin.bad()) bytes = Data(all.begin(), all.end());
  } else {
    bytes = readFile(path);
  }
  if (!bytes) {
    error = "cannot read '" + path + "'";
    return std::nullopt;
  }
  std::optional<PropertyList> root;
  std::size_t first = 0;
  while (first < bytes->size() && std::isspace((*bytes)[first])) ++first;
  if (first < bytes->size() && ((*bytes)[first] == '[' || (*bytes)[first] == '{')) {
    json parsed = json::parse(bytes->begin(), bytes->end(), nullptr, false);
    if (parsed.is_discarded()) {
      error = "'" + path + "' is not valid JSON";
      return std::nullopt;
    }
    std::string why;
    root = propertyListFromJSON(parsed, 0, why);
    if (!root) {
      error = "'" + path + "': " + why;
      return std::nullopt;
    }
  } else {
    std::string why;
    root = PropertyList::deserialize(*bytes, &why);
    if (!root) {
      error = "'" + path + "' is neither JSON nor a property list (" + why + ")";
      return std::nullopt;
    }
  }
  if (!root->array()) {
    error = "'" + path + "' must hold an array of block dictionaries";
    return std::nullopt;
  }
  for (std::size_t i = 0; i < root->array()->size(); ++i) {
    if (!(*root->array())[i].dictionary()) {
      error = "'" + path + "': element " + std::to_string(i) + " is not a block dictionary";
      return std::nullopt;
    }
    if (!RVRecognitionBlock::isWithinTreeDepth((*root->array())[i])) {
      error = "'" + path + "': element " + std::to_string(i) + " nests deeper than " +
              std::to_string(RVRecognitionBlock::kMaxTreeDepth) + " block levels";
      return std::nullopt;
    }
  }
  return std::move(*root->array());
}

// The first block (depth first) whose "boundingBox" is not the rectangle text form with
// four finite numbers, described; "" when every box reads. The library's own reading
// takes missing numbers as 0, which would put a mistyped box at the page's corner.
std::string unreadableBox(const PropertyList::Array& blocks, const std::string& where) {
  static const std::regex kRect(
      R"(\s*\{\s*\{\s*([^,{}]+),\s*([^,{}]+)\}\s*,\s*\{\s*([^,{}]+),\s*([^,{}]+)\}\s*\}\s*)");
  for (std::size_t i = 0; i < blocks.size(); ++i) {
    const auto* info = blocks[i].dictionary();
    if (!info) continue;
    std::string here = where + "element " + std::to_string(i);
    auto box = info->find("boundingBox");
    const String* text = box == info->end() ? nullptr : box->second.string();
    std::smatch match;
    std::string utf8 = text ? toUTF8(*text) : "";
    bool readable = text && std::regex_match(utf8, match, kRect);
    for (std::size_t n = 1; readable && n <= 4; ++n) {
      std::string number = match[n].str();
      while (!number.empty() && std::isspace(static_cast<unsigned char>(number.back())))
        number.pop_back();
      char* end = nullptr;
      double value = std::strtod(number.c_str(), &end);
      readable = !number.empty() && *end == '\0' && std::isfinite(value);
    }
    if (!readable) {
      return here + ": boundingBox " + (text ? "'" + utf8 + "'" : std::string("missing")) +
             " is not {{x, y}, {w, h}}";
    }
    auto children = info->find("childBlocks");
    if (children != info->end() && children->second.array()) {
      std::string inner = unreadableBox(*children->second.array(), here + " > ");
      if (!inner.empty()) return inner;
    }
  }
  return "";
}

const char* levelName(RVRecognitionBlockLevel level) {
  switch (level) {
    case RVRecognitionBlockLevelColumn:
      return "column";
    case RVRecognitionBlockLevelParagraph:
      return "paragraph";
    case RVRecognitionBlockLevelLine:
      return "line";
  }
  return "block";
}

// Boxes rounded for reading; --json gives the exact values.
std::string roundedRect(const Rect& r) {
  char text[128];
  std::snprintf(text, sizeof text, "{{%.4g, %.4g}, {%.4g, %.4g}}", r.origin.x, r.origin.y,
                r.size.width, r.size.height);
  return text;
}

void printTree(const RVBlockArray& blocks, int depth, std::ostream& out) {
  if (depth > RVRecognitionBlock::kMaxTreeDepth) return;
  std::size_t number = 0;
  for (const auto& block : blocks) {
    if (!block) continue;
    out << std::string(2 * depth, ' ');
    if (block->children().empty()) {
      out << toUTF8(block->description()) << '\n';
      continue;
    }
    out << levelName(block->level()) << ' ' << ++number << ' ' << roundedRect(block->boundingBox())
        << '\n';
    printTree(block->children(), depth + 1, out);
  }
}

int run(const Arguments& args) {
  Output output = Output::Text;
  std::optional<std::string> path;
  for (const std::string& arg : args) {
    if (arg == "--json") {
      output = Output::Json;
    } else if (arg == "--tree") {
      output = Output::Tree;
    } else if (arg.size() > 1 && arg[0] == '-') {
      return misuse("layout: unknown option '" + arg + "'");
    } else if (path) {
      return misuse("layout: one file at a time");
    } else {
      path = arg;
    }
  }
  if (!path) return misuse("layout: no file given (corvel layout FILE [--json | --tree])");
  std::string error;
  std::optional<PropertyList::Array> infos = readBlockArray(*path, error);
  if (!infos) return misuse("layout: " + error);
  if (std::string bad = unreadableBox(*infos, ""); !bad.empty()) {
    return misuse("layout: '" + *path + "': " + bad);
  }

  auto analyser = RVTextLayoutAnalyser::init();
  for (const PropertyList& info : *infos)
    analyser->addRecognitionBlock(RVRecognitionBlock::createBlockFromInfo(info));
  analyser->analyse(Size{1, 1}, RVWritingDirectionHorizontal);

  // An empty layout is "found nothing", as a blank page is for ocr.
  int status = analyser->text().empty() ? 1 : 0;
  switch (output) {
    case Output::Text:
      std::cout << toUTF8(analyser->text()) << '\n';
      break;
    case Output::Json: {
      json columns = json::array();
      for (const auto& column : *analyser->layoutBlocks())
        columns.push_back(jsonFromPropertyList(column->blockInformation()));
      std::cout << columns.dump(2) << '\n';
      break;
    }
    case Output::Tree:
      printTree(*analyser->layoutBlocks(), 0, std::cout);
      break;
  }
  return status;
}

CommandRegistration reg(
    "layout",
    "layout FILE [--json | --tree] : reading-order text of line blocks "
    "(JSON array or plist of block dictionaries; - reads standard input); --json prints the column "
    "tree as block dictionaries, --tree as indented text",
    &run, "--json --tree");

}  // namespace

}  // namespace corvel::tool
