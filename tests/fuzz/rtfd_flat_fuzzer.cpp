// Flat RTFD (serialised bundles): a bundle that is read serialises to bytes that read
// back to the same bundle, and its text survives writing and reading.
#include "Corvelbase/platform/FileWrapper.h"
#include "Corvelbase/platform/RTFD.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  Data bytes(data, data + size);
  if (auto bundle = FileWrapper::initWithSerializedRepresentation(bytes)) {
    Data flat = bundle->serializedRepresentation();
    auto back = FileWrapper::initWithSerializedRepresentation(flat);
    FUZZ_CHECK(back);
    FUZZ_CHECK(back->serializedRepresentation() == flat);
  }
  if (auto text = attributedStringWithRTFD(bytes)) {
    auto again = attributedStringWithRTFD(RTFDFromRange(*text, Range{0, text->length()}));
    FUZZ_CHECK(again);
    FUZZ_CHECK(again->string() == text->string());
  }
  return 0;
}
