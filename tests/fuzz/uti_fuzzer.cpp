// Type identifiers: every identifier equals and conforms to itself and comes first among
// its supertypes; the type of any extension or MIME type is an item, and a dynamic one
// gives its tag back.
#include "Corvelbase/UTI.h"
#include "Corvelbase/platform/TypeRegistry.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string text(reinterpret_cast<const char*>(data), size);
  const TypeRegistry& types = TypeRegistry::shared();
  FUZZ_CHECK(types.equal(text, text));
  FUZZ_CHECK(types.conformsTo(text, text));
  auto supertypes = types.supertypes(text);
  FUZZ_CHECK(!supertypes.empty() && supertypes.front() == text);
  std::string byExtension = types.typeForFilenameExtension(text);
  FUZZ_CHECK(types.conformsTo(byExtension, "public.item"));
  if (TypeRegistry::isDynamic(byExtension)) {
    auto tag = types.preferredFilenameExtension(byExtension);
    FUZZ_CHECK(tag && types.equal(*tag, text));
  }
  std::string byMIME = types.typeForMIMEType(text);
  FUZZ_CHECK(types.conformsTo(byMIME, "public.item"));
  String uti = fromUTF8(text);
  FUZZ_CHECK(UTI::isEqualToUTI(uti, uti) == UTI::isEqualToUTIString(uti, uti));
  (void)UTI::validUTIString(uti);
  (void)UTI::isRTFKindUTI(uti);
  return 0;
}
