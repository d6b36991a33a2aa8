// The drawings' pasteboard item as another process may have written it: pasting reads
// exactly what the keyed-archive reader reads from it, and nothing when that refuses.
#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/Platform.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static auto board = [] {
    auto b = std::make_shared<MemoryPasteboard>();
    PlatformRegistry::setGeneralPasteboard(b);
    return b;
  }();
  Data item(data, data + size);
  board->clearContents();
  board->setData(item, RVPencilPasteboardData);
  pastedPencilDataDictionary = PencilDataDictionary{{"stale", Data{1}}};
  PencilDrawings::checkForPencilDataOnPaste(AttributedString(u"\uFFFC"));
  FUZZ_CHECK(pastedPencilDataDictionary == KeyedArchive::unarchiveDictionary(item));
  return 0;
}
