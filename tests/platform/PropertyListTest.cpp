#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>

#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/PropertyList.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

// Every kind of value, nested, with text outside the BMP.
PropertyList sampleTree() {
  PropertyList::Dictionary child{{"text", u"caf\u00e9 \U0001F600"},
                                 {"confidence", 0.25},
                                 {"level", std::uint64_t{2}},
                                 {"empty", PropertyList::Array{}}};
  return PropertyList::Dictionary{{"flag", true},
                                  {"bytes", Data{0, 1, 2, 255}},
                                  {"uid", PropertyList::Uid{7}},
                                  {"children", PropertyList::Array{child, child}}};
}

TEST(PropertyList, RoundTripsThroughBinaryAndXML) {
  PropertyList tree = sampleTree();
  auto binary = tree.serialize(PropertyList::Format::Binary);
  ASSERT_TRUE(binary);
  EXPECT_EQ(std::string(binary->begin(), binary->begin() + 8), "bplist00");
  EXPECT_EQ(PropertyList::deserialize(*binary), tree);

  PropertyList noUid = tree;
  noUid.dictionary()->erase("uid");
  auto xml = noUid.serialize(PropertyList::Format::XML);
  ASSERT_TRUE(xml);
  EXPECT_NE(std::string(xml->begin(), xml->end()).find("<plist"), std::string::npos);
  EXPECT_EQ(PropertyList::deserialize(*xml), noUid);
}

TEST(PropertyList, NumberConversionsFollowThePlatformsNumbers) {
  EXPECT_EQ(PropertyList(0.1).floatValue(), 0.1f);
  EXPECT_EQ(PropertyList(std::uint64_t{5000000000}).unsignedIntValue(), 705032704u);
  EXPECT_EQ(PropertyList(u"12.5abc").doubleValue(), 12.5);
  EXPECT_EQ(PropertyList(Data{1}).doubleValue(), 0);
  EXPECT_EQ(PropertyList(std::numeric_limits<double>::quiet_NaN()).unsignedIntValue(), 0u);
  EXPECT_EQ(PropertyList(1e300).unsignedIntegerValue(), UINT64_MAX);
}

TEST(PropertyList, FilesAreWrittenWholeAndReadBack) {
  testing::TempDir dir;
  std::string path = dir.file("tree.plist");
  ASSERT_TRUE(sampleTree().writeToFile(path, PropertyList::Format::Binary));
  EXPECT_EQ(PropertyList::readFromFile(path), sampleTree());
  EXPECT_FALSE(PropertyList::readFromFile(dir.file("missing.plist")));
  // A failed write leaves the previous file in place and no temporary behind.
  EXPECT_FALSE(PropertyList().writeToFile(path, PropertyList::Format::Binary));
  EXPECT_EQ(PropertyList::readFromFile(path), sampleTree());
  EXPECT_FALSE(writeFileAtomically(dir.file("no/such/dir/file"), Data{1}));
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()), {}), 1);
}

// A host's own caches directory is walked by the drawings' tests.
TEST(Files, CachesDirectoryFollowsTheEnvironmentAndIsCreated) {
  testing::TempDir dir;
  std::string xdg = dir.file("xdg");
  setenv("XDG_CACHE_HOME", xdg.c_str(), 1);
  EXPECT_EQ(cachesDirectory(), xdg);
  EXPECT_TRUE(std::filesystem::is_directory(xdg));
  setenv("XDG_CACHE_HOME", "relative/path", 1);
  std::string home = dir.file("home");
  setenv("HOME", home.c_str(), 1);
  EXPECT_EQ(cachesDirectory(), home + "/.cache");
  unsetenv("XDG_CACHE_HOME");
}

TEST(Strings, ConversionsReplaceWhatIsNotUnicode) {
  EXPECT_EQ(toUTF8(u"a\U0001F600z"), "a\xF0\x9F\x98\x80z");
  EXPECT_EQ(fromUTF8("a\xF0\x9F\x98\x80z"), u"a\U0001F600z");
  EXPECT_EQ(toUTF8(String{u'x', 0xD800, u'y'}), "x\xEF\xBF\xBDy");
  EXPECT_EQ(fromUTF8("a\xFFz"), (String{u'a', 0xFFFD, u'z'}));
}

// Hosts match on this text in their logs; what reaches the log sink is checked where
// errors are logged.
TEST(Error, DescriptionHasThePlatformsForm) {
  Error error{"com.example", 200, {{"Error reason", u"broken"}}};
  EXPECT_EQ(error.description(),
            "Error Domain=com.example Code=200 \"(null)\" UserInfo={Error reason=broken}");
}

}  // namespace
}  // namespace corvel
