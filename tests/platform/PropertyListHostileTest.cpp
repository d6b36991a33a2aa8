// Property lists from outside: text holding U+0000, keys that are not UTF-8, dates, and
// lists built to exhaust the parser. Binary lists are assembled here byte by byte.
#include <gtest/gtest.h>

#include <bit>
#include <chrono>
#include <limits>

#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/PropertyList.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using Bytes = std::vector<std::uint8_t>;

// Byte `index` of `value`, 0 the lowest.
std::uint8_t byteOf(std::size_t value, int index) { return std::uint8_t(value >> (8 * index)); }

// A binary property list of `objects` (each its marker and body, references
// `referenceSize` bytes wide), whose root is the first object. Offsets take two bytes.
Data bplist(const std::vector<Bytes>& objects, std::uint8_t referenceSize = 1) {
  Data out{'b', 'p', 'l', 'i', 's', 't', '0', '0'};
  std::vector<std::size_t> offsets;
  for (const Bytes& object : objects) {
    offsets.push_back(out.size());
    out.insert(out.end(), object.begin(), object.end());
  }
  std::size_t table = out.size();
  for (std::size_t offset : offsets) out.insert(out.end(), {byteOf(offset, 1), byteOf(offset, 0)});
  Data trailer(32, 0);
  trailer[6] = 2, trailer[7] = referenceSize;  // offset and reference sizes
  trailer[14] = byteOf(objects.size(), 1), trailer[15] = byteOf(objects.size(), 0);
  trailer[30] = byteOf(table, 1), trailer[31] = byteOf(table, 0);
  out.insert(out.end(), trailer.begin(), trailer.end());
  return out;
}

// `levels` arrays, each holding the next `width` times, around an integer.
Data nestedArrays(int levels, int width) {
  std::vector<Bytes> objects;
  for (int i = 0; i < levels; ++i) {
    Bytes array{static_cast<std::uint8_t>(0xA0 | width)};
    for (int j = 0; j < width; ++j) array.insert(array.end(), {byteOf(i + 1, 1), byteOf(i + 1, 0)});
    objects.push_back(array);
  }
  objects.push_back({0x10, 7});
  return bplist(objects, 2);
}

Bytes date(double seconds) {
  auto bits = std::bit_cast<std::uint64_t>(seconds);
  Bytes out{0x33};
  for (int shift = 56; shift >= 0; shift -= 8)
    out.push_back(static_cast<std::uint8_t>(bits >> shift));
  return out;
}

// Regression: libplist asserted (aborting the host) on U+0000 in UTF-16 text.
TEST(PropertyListHostile, NulInUtf16TextIsKeptInValuesAndRefusedInKeys) {
  Bytes nulText{0x62, 0x00, 'a', 0x00, 0x00};  // UTF-16 "a", U+0000
  auto value = PropertyList::deserialize(bplist({nulText}));
  ASSERT_TRUE(value);
  EXPECT_EQ(*value, PropertyList(String(u"a\0", 2)));
  // libplist writes C strings: such a value cannot be written, so it is not.
  EXPECT_FALSE(value->serialize(PropertyList::Format::Binary));

  std::string why;
  EXPECT_FALSE(PropertyList::deserialize(bplist({{0xD1, 1, 2}, nulText, {0x51, 'v'}}), &why));
  EXPECT_NE(why.find("U+0000"), std::string::npos) << why;
  // The same reaches the pasteboard's reader, which must answer, not abort.
  EXPECT_FALSE(KeyedArchive::unarchiveDictionary(bplist({{0xD1, 1, 2}, nulText, {0x51, 'v'}})));
}

// Regression: a key of bytes that are not UTF-8 was kept and then written as a list that could
// not be read back.
TEST(PropertyListHostile, KeysThatAreNotUtf8AreRefusedBothWays) {
  std::string why;
  EXPECT_FALSE(
      PropertyList::deserialize(bplist({{0xD1, 1, 2}, {0x52, 0x99, 'k'}, {0x51, 'v'}}), &why));
  EXPECT_NE(why.find("UTF-8"), std::string::npos) << why;
  PropertyList tree = PropertyList::Dictionary{{"\x99k", true}};
  EXPECT_FALSE(tree.serialize(PropertyList::Format::Binary));
  EXPECT_FALSE(tree.serialize(PropertyList::Format::XML));
  EXPECT_FALSE(KeyedArchive::archiveDictionary({{"\x99k", Data{1}}}, &why));
  EXPECT_EQ(why, "a key is not UTF-8");
}

// Regression: dates were shifted by the Unix epoch's offset both ways, and one past 2038 went
// through an overflowing int32_t cast.
TEST(PropertyListHostile, DatesAgreeWithAnotherProgramBothWays) {
  auto theirs =
      PropertyList::readFromFile(testing::fixturePath("plist/date-2024-01-01-by-plistlib.bplist"));
  ASSERT_TRUE(theirs);
  EXPECT_EQ(*theirs, PropertyList(PropertyList::Date{725760000}));  // 2024-01-01 00:00 UTC

  testing::TempDir dir;
  std::string ours = dir.file("date.bplist");
  ASSERT_TRUE(PropertyList(PropertyList::Date{725760000.25})
                  .writeToFile(ours, PropertyList::Format::Binary));
  auto read = testing::runCommand(
      "python3 -c 'import plistlib,sys; print(plistlib.load(open(sys.argv[1], \"rb\")))' " + ours);
  EXPECT_EQ(read.output, "2024-01-01 00:00:00.250000\n");

  for (double beyond : {2147483648.0, -2147483649.0, std::numeric_limits<double>::infinity()})
    EXPECT_FALSE(PropertyList(PropertyList::Date{beyond}).serialize(PropertyList::Format::Binary));
  EXPECT_FALSE(PropertyList::deserialize(bplist({date(3e9)})));
}

// Negative dates came back with the wrong sign on their fraction (-1.25 read as -0.75).
TEST(PropertyListHostile, DatesRoundTripToWithinAMicrosecond) {
  for (double seconds : {-1.25, 0.5, 1.000001, 725760000.123456, 725760000.999999, -2147483647.5}) {
    PropertyList value(PropertyList::Date{seconds});
    auto bytes = value.serialize(PropertyList::Format::Binary);
    ASSERT_TRUE(bytes) << seconds;
    auto back = PropertyList::deserialize(*bytes);
    ASSERT_TRUE(back) << seconds;
    auto got = std::get<PropertyList::Date>(back->value()).secondsSinceReferenceDate;
    EXPECT_NEAR(got, seconds, 1.01e-6) << seconds;
  }
}

TEST(PropertyListHostile, OverLimitListsAreRefusedQuicklyWithTheReason) {
  struct Case {
    const char* name;
    Data bytes;
    const char* reason;
  };
  std::string deepXml = "<plist>";
  for (int i = 0; i <= kMaxPropertyListDepth; ++i) deepXml += "<array>";
  Case cases[] = {
      // 2^30 objects once every shared reference is copied, as libplist copies them.
      {"expansion", nestedArrays(30, 2), "more than 1000000 objects"},
      {"binary depth", nestedArrays(kMaxPropertyListDepth + 1, 1), "deeper than 512"},
      {"XML depth", Data(deepXml.begin(), deepXml.end()), "deeper than 512"},
      {"size", Data(kMaxPropertyListBytes + 1, ' '), "larger than 64 MiB"},
      {"cycle", bplist({{0xA1, 1}, {0xA1, 0}}), "cycle"},
  };
  for (const Case& c : cases) {
    auto start = std::chrono::steady_clock::now();
    std::string why;
    EXPECT_FALSE(PropertyList::deserialize(c.bytes, &why)) << c.name;
    EXPECT_NE(why.find(c.reason), std::string::npos) << c.name << ": " << why;
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(1)) << c.name;
  }
  // At the depth limit itself the list is read.
  EXPECT_TRUE(PropertyList::deserialize(nestedArrays(kMaxPropertyListDepth, 1)));
}

}  // namespace
}  // namespace corvel
