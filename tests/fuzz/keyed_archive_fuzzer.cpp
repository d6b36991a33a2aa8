// Keyed archives: a refusal says why; a dictionary that is read archives (unless a key
// holds U+0000, which property lists cannot carry) to bytes that read back the same.
#include "Corvelbase/platform/KeyedArchive.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string why;
  auto dictionary = KeyedArchive::unarchiveDictionary(Data(data, data + size), &why);
  if (!dictionary) {
    FUZZ_CHECK(!why.empty());
    return 0;
  }
  bool nulKey = false;
  for (const auto& [key, value] : *dictionary) nulKey |= key.find('\0') != std::string::npos;
  auto archived = KeyedArchive::archiveDictionary(*dictionary);
  FUZZ_CHECK(archived.has_value() != nulKey);
  if (archived) FUZZ_CHECK(KeyedArchive::unarchiveDictionary(*archived) == dictionary);
  return 0;
}
