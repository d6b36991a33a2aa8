// Base64: any bytes encode, in every line form, to text that decodes back to them; text
// that decodes encodes back to text that decodes the same.
#include "Corvelbase/platform/Base64.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  Data bytes(data, data + size);
  for (std::uint32_t options : {0u, 1u, 2u, 1u | 16u, 2u | 32u, 1u | 16u | 32u}) {
    FUZZ_CHECK(base64Decoding(base64Encoding(bytes, options)) == bytes);
  }
  if (auto decoded = base64Decoding(std::string_view(reinterpret_cast<const char*>(data), size)))
    FUZZ_CHECK(base64Decoding(base64Encoding(*decoded)) == decoded);
  return 0;
}
