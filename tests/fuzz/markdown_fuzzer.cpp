// Markdown commands: a selection taken from the input's first bytes, the rest the text.
// Every command's replacement range lies inside the text, and applying the edit keeps
// the text outside that range.
#include "Corvelbase/MarkdownCommands.h"
#include "FuzzSupport.h"

using namespace corvel;
namespace md = corvel::MarkdownCommands;

namespace {

void checkEdit(const String& text, const String& inserted, Range replaced) {
  FUZZ_CHECK(replaced.location <= text.size());
  FUZZ_CHECK(replaced.length <= text.size() - replaced.location);
  String edited = text;
  edited.replace(replaced.location, replaced.length, inserted);
  FUZZ_CHECK(edited.compare(0, replaced.location, text, 0, replaced.location) == 0);
  FUZZ_CHECK(edited.size() - inserted.size() == text.size() - replaced.length);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input in(data, size);
  std::uint8_t command = in.byte();
  // Mostly selections inside the text, sometimes anywhere at all.
  std::uint64_t location = in.word(), length = in.word();
  bool wild = in.byte() == 0xFF;
  String text = fromUTF8(in.rest());
  if (!wild) {
    location %= text.size() + 1;
    length %= text.size() - location + 1;
  } else {
    location = location << 48 | length;
  }
  Range range{location, length};
  Range replaced{NotFound, 0}, selected{NotFound, 0};
  String out;
  switch (command % 10) {
    case 0:
      out = md::insertTaskList(text, range, &replaced, &selected);
      break;
    case 1:
      out = md::insertUnorderedList(text, range, &replaced, &selected);
      break;
    case 2:
      out = md::insertQuote(text, range, &replaced, &selected);
      break;
    case 3:
      out = md::insertNumberedList(text, range, &replaced, &selected);
      break;
    case 4:
      out = md::insertHorizontalLine(text, range, &replaced);
      break;
    case 5:
      out = md::setMarkdownHeaderLevel(text, command / 10 % 8, range, &replaced);
      break;
    case 6:
      out = md::incrementMarkdownHeader(text, range, &replaced);
      break;
    case 7:
      out = md::insertCodeBlock(text, range, &replaced).value_or(u"");
      break;
    case 8:
      out = md::insertTable(text, range, command % 4, command / 64, &replaced);
      break;
    default:
      out = md::insertHTMLJustity(text, command % 3, range, &replaced);
      break;
  }
  if (replaced.location != NotFound) checkEdit(text, out, replaced);
  Range link{0, 0};
  md::lineContainsMarkdownLink(text, range, &link, nullptr);
  if (link.location != NotFound) FUZZ_CHECK(link.location + link.length <= text.size());
  return 0;
}
