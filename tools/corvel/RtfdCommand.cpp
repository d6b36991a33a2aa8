// corvel rtfd: the text of a rich-text bundle, each attachment shown by its file name.
#include <sys/stat.h>

#include <iostream>
#include <iterator>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/RTFD.h"
#include "Corvelbase/platform/TextAttachment.h"
#include "tools/corvel/Commands.h"

namespace corvel::tool {
namespace {

// "[name]" for an attachment with a file, "[attachment]" for one without.
std::string placeholder(const TextAttachment& attachment) {
  auto wrapper = attachment.fileWrapper();
  if (!wrapper || !wrapper->filename()) return "[attachment]";
  return "[" + *wrapper->filename() + "]";
}

int run(const Arguments& args) {
  if (args.size() != 1 || args[0].empty())
    return misuse("rtfd: give one bundle directory or flat RTFD file");
  const std::string& path = args[0];
  struct stat info {};
  std::optional<AttributedString> text;
  // A directory is a bundle; a file is the flat form of one.
  if (path == "-") {
    // Standard input holds the flat form.
    std::string all((std::istreambuf_iterator<char>(std::cin)), std::istreambuf_iterator<char>());
    if (!std::cin.bad()) text = attributedStringWithRTFD(Data(all.begin(), all.end()));
  } else if (::stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode)) {
    text = attributedStringWithContentsOfRTFD(path);
  } else if (auto bytes = readFile(path)) {
    text = attributedStringWithRTFD(*bytes);
  }
  if (!text) {
    std::cerr << "corvel: " << path << ": cannot be read as an RTFD bundle or its flat form\n";
    return 2;
  }
  std::string out;
  String pending;  // converted in one piece so surrogate pairs stay whole
  text->enumerateAttribute(AttachmentAttributeName, Range{0, text->length()}, 0,
                           [&](const AttributeValue* value, Range range, bool*) {
                             const auto* attachment =
                                 value ? std::get_if<std::shared_ptr<TextAttachment>>(value)
                                       : nullptr;
                             for (auto i = range.location; i < range.max(); ++i) {
                               char16_t unit = text->string()[i];
                               if (!attachment || !*attachment || unit != AttachmentCharacter) {
                                 pending += unit;
                                 continue;
                               }
                               out += toUTF8(pending) + placeholder(**attachment);
                               pending.clear();
                             }
                           });
  out += toUTF8(pending);
  std::cout << out << '\n';
  return 0;
}

CommandRegistration reg(
    "rtfd",
    "rtfd BUNDLE-OR-FLAT-FILE : the text of an RTFD bundle (a directory, - for standard input, or "
    "its flat form in one file), each attachment as [file name]",
    &run);

}  // namespace
}  // namespace corvel::tool
