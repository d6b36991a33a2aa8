// Property lists: a refusal says why; a list that is read is written in binary (unless
// its text holds U+0000, which libplist cannot write) and reads back the same, dates to
// within the microsecond libplist may drop; the XML form reads back too.
#include <cmath>
#include <variant>

#include "Corvelbase/platform/PropertyList.h"
#include "FuzzSupport.h"

using namespace corvel;

namespace {

bool holds(const PropertyList& value, bool (*test)(const PropertyList&)) {
  if (test(value)) return true;
  if (auto array = value.array())
    for (const auto& item : *array)
      if (holds(item, test)) return true;
  if (auto dict = value.dictionary())
    for (const auto& [key, item] : *dict)
      if (holds(item, test)) return true;
  return false;
}

bool nulText(const PropertyList& value) {
  return value.string() && value.string()->find(u'\0') != String::npos;
}

bool uid(const PropertyList& value) { return value.uid() != nullptr; }

bool same(const PropertyList& a, const PropertyList& b) {
  if (a.value().index() != b.value().index()) return false;
  if (auto x = std::get_if<PropertyList::Date>(&a.value())) {
    // A microsecond, and the double's own rounding (half a microsecond at 2^31 s).
    double seconds = x->secondsSinceReferenceDate;
    double other = std::get<PropertyList::Date>(b.value()).secondsSinceReferenceDate;
    return std::fabs(seconds - other) <= 1e-6 + std::fabs(seconds) * 1e-15;
  }
  if (auto x = std::get_if<double>(&a.value())) {
    double y = std::get<double>(b.value());
    return *x == y || (std::isnan(*x) && std::isnan(y));
  }
  if (auto x = a.array()) {
    auto y = b.array();
    if (x->size() != y->size()) return false;
    for (std::size_t i = 0; i < x->size(); ++i)
      if (!same((*x)[i], (*y)[i])) return false;
    return true;
  }
  if (auto x = a.dictionary()) {
    auto y = b.dictionary();
    if (x->size() != y->size()) return false;
    for (auto i = x->begin(), j = y->begin(); i != x->end(); ++i, ++j)
      if (i->first != j->first || !same(i->second, j->second)) return false;
    return true;
  }
  return a == b;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string why;
  auto tree = PropertyList::deserialize(data, size, &why);
  if (!tree) {
    FUZZ_CHECK(!why.empty());
    return 0;
  }
  bool writable = !holds(*tree, nulText);
  auto binary = tree->serialize(PropertyList::Format::Binary);
  FUZZ_CHECK(binary.has_value() == writable);
  if (!binary) return 0;
  auto back = PropertyList::deserialize(*binary);
  FUZZ_CHECK(back);
  FUZZ_CHECK(same(*tree, *back));
  if (!holds(*tree, uid)) {  // XML has no UIDs
    auto xml = tree->serialize(PropertyList::Format::XML);
    FUZZ_CHECK(xml);
    FUZZ_CHECK(PropertyList::deserialize(*xml));
  }
  return 0;
}
