// Block trees in their dictionary form, as `corvel layout` reads them (a JSON array, or a
// property list): a tree within the depth limit is built, and building from what it
// writes is stable; the layout analysis of the lines gives a text.
#include <nlohmann/json.hpp>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "FuzzSupport.h"
#include "tools/corvel/JsonConversion.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::optional<PropertyList> root;
  if (size > 0 && (data[0] == '[' || data[0] == '{')) {
    auto parsed = nlohmann::json::parse(data, data + size, nullptr, false);
    std::string why;
    if (!parsed.is_discarded()) root = tool::propertyListFromJSON(parsed, 0, why);
  } else {
    root = PropertyList::deserialize(data, size);
  }
  if (!root || !root->array()) return 0;
  auto analyser = RVTextLayoutAnalyser::init();
  for (const PropertyList& info : *root->array()) {
    if (!info.dictionary() || !RVRecognitionBlock::isWithinTreeDepth(info)) continue;
    auto block = RVRecognitionBlock::createBlockFromInfo(info);
    FUZZ_CHECK(block);
    // Compared as written bytes: a NaN confidence is equal to itself there.
    PropertyList written = block->blockInformation();
    auto again = RVRecognitionBlock::createBlockFromInfo(written);
    FUZZ_CHECK(again);
    FUZZ_CHECK(again->blockInformation().serialize(PropertyList::Format::Binary) ==
               written.serialize(PropertyList::Format::Binary));
    analyser->addRecognitionBlock(block);
  }
  analyser->analyse(Size{1, 1}, RVWritingDirectionHorizontal);
  (void)analyser->text();
  return 0;
}
