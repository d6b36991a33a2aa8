// E-mail header values: the first input line is the field, the rest the message. A value
// is part of one line of the message; an address is part of the value and holds "@".
#include "Corvelbase/Email.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string input(reinterpret_cast<const char*>(data), size);
  std::size_t end = input.find('\n');
  if (end == std::string::npos) return 0;
  String field = fromUTF8(input.substr(0, end)), message = fromUTF8(input.substr(end + 1));
  auto value = Email::headerValueForField(message, field);
  if (!value) return 0;
  FUZZ_CHECK(message.find(*value) != String::npos);
  FUZZ_CHECK(value->find_first_of(u"\n\r\u2028\u2029\u0085") == String::npos);
  if (auto address = Email::headerValueForField(message, field, true); address && !value->empty()) {
    FUZZ_CHECK(value->find(*address) != String::npos);
    FUZZ_CHECK(address->find(u'@') != String::npos);
  }
  return 0;
}
