// RTF documents: what is read is written and read back as the same characters.
#include "Corvelbase/platform/RTFD.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  auto text = attributedStringWithRTF(Data(data, data + size));
  if (!text) return 0;
  auto again = attributedStringWithRTFD(RTFDFromRange(*text, Range{0, text->length()}));
  FUZZ_CHECK(again);
  FUZZ_CHECK(again->string() == text->string());
  return 0;
}
