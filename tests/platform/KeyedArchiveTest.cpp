#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <functional>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/PropertyList.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Uid = PropertyList::Uid;

const StringDataDictionary kStrokes = {
    {"0F8E2C1A-6B3D-4E5F-8A9B-0C1D2E3F4A5B", Data{0, 1, 2, 3, 255}},
    {"A1B2C3D4-E5F6-4789-ABCD-EF0123456789", Data(1000, 0x42)},
    {"caf\xC3\xA9", Data{}},
};

std::string hex(const Data& data) {
  static const char digits[] = "0123456789abcdef";
  std::string out;
  for (auto b : data) out += {digits[b >> 4], digits[b & 15]};
  return out;
}

// Builds an archive by hand from an object table, to feed the reader what our writer
// never produces.
Data archiveOf(Array objects, PropertyList root = Uid{1}) {
  PropertyList archive = Dictionary{{"$archiver", u"NSKeyedArchiver"},
                                    {"$version", std::uint64_t{100000}},
                                    {"$top", Dictionary{{"root", root}}},
                                    {"$objects", std::move(objects)}};
  return *archive.serialize(PropertyList::Format::Binary);
}

PropertyList classOf(const char16_t* name) {
  return Dictionary{{"$classname", String(name)}, {"$classes", Array{String(name), u"NSObject"}}};
}

PropertyList dictionaryObject(Array keys, Array values, std::uint64_t classUid) {
  return Dictionary{
      {"NS.keys", std::move(keys)}, {"NS.objects", std::move(values)}, {"$class", Uid{classUid}}};
}

TEST(KeyedArchive, RoundTripsAndHasThePlatformStructure) {
  auto bytes = KeyedArchive::archiveDictionary(kStrokes);
  ASSERT_TRUE(bytes);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*bytes), kStrokes);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*KeyedArchive::archiveDictionary({})),
            StringDataDictionary{});

  auto plist = PropertyList::deserialize(*bytes);
  ASSERT_TRUE(plist);
  const Array& objects = *plist->find("$objects")->array();
  EXPECT_EQ(objects[0], PropertyList(u"$null"));
  EXPECT_EQ(*plist->find("$top"), PropertyList(Dictionary{{"root", Uid{1}}}));
  // Keys are encoded before values, and the class description comes last.
  const PropertyList& dict = objects[1];
  EXPECT_EQ(*dict.find("NS.keys"), PropertyList(Array{Uid{2}, Uid{3}, Uid{4}}));
  EXPECT_EQ(*dict.find("NS.objects"), PropertyList(Array{Uid{5}, Uid{6}, Uid{7}}));
  EXPECT_EQ(*dict.find("$class"), PropertyList(Uid{8}));
  EXPECT_EQ(objects[8],
            PropertyList(Dictionary{
                {"$classname", u"NSMutableDictionary"},
                {"$classes", Array{u"NSMutableDictionary", u"NSDictionary", u"NSObject"}}}));
}

TEST(KeyedArchive, AnOutsideParserReadsTheDictionary) {
  testing::TempDir dir;
  std::string path = dir.file("strokes.archive");
  ASSERT_TRUE(writeFileAtomically(path, *KeyedArchive::archiveDictionary(kStrokes)));
  auto result = testing::runCommand("NODE_PATH='" CORVEL_NODE_MODULES "' node '" CORVEL_SUPPORT_DIR
                                    "/read-keyed-archive.js' '" +
                                    path + "'");
  ASSERT_EQ(result.status, 0) << result.output;
  auto json = nlohmann::json::parse(result.output);
  EXPECT_EQ(json["archiver"], "NSKeyedArchiver");
  EXPECT_EQ(json["version"], 100000);
  EXPECT_EQ(json["className"], "NSMutableDictionary");
  ASSERT_EQ(json["entries"].size(), kStrokes.size());
  for (const auto& [key, value] : kStrokes) EXPECT_EQ(json["entries"][key], hex(value)) << key;
}

TEST(KeyedArchive, ReadsTheOtherFormsThePlatformWrites) {
  // Immutable dictionary, mutable data and string objects, and an XML property list.
  Array objects{u"$null",
                dictionaryObject({Uid{2}}, {Uid{4}}, 6),
                Dictionary{{"NS.string", u"key"}, {"$class", Uid{3}}},
                classOf(u"NSMutableString"),
                Dictionary{{"NS.data", Data{9, 8, 7}}, {"$class", Uid{5}}},
                classOf(u"NSMutableData"),
                classOf(u"NSDictionary")};
  Data binary = archiveOf(objects);
  StringDataDictionary expected{{"key", Data{9, 8, 7}}};
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(binary), expected);

  auto plist = PropertyList::deserialize(binary);
  // Re-spell every UID the way XML lists do, {"CF$UID": n}.
  std::function<void(PropertyList&)> respell = [&](PropertyList& v) {
    if (auto uid = v.uid()) {
      v = Dictionary{{"CF$UID", std::uint64_t{uid->value}}};
    } else if (auto d = v.dictionary()) {
      for (auto& [k, c] : *d) respell(c);
    } else if (auto a = v.array()) {
      for (auto& c : *a) respell(c);
    }
  };
  respell(*plist);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*plist->serialize(PropertyList::Format::XML)),
            expected);
}

TEST(KeyedArchive, HostileArchivesGiveNothing) {
  auto good = *KeyedArchive::archiveDictionary(kStrokes);
  std::string junk = "definitely not a property list";
  PropertyList notArchive = Dictionary{{"$objects", Array{u"$null"}}};
  struct Case {
    const char* name;
    Data bytes;
    const char* reasonWord;
  } cases[] = {
      {"empty", {}, "not a property list"},
      {"text", Data(junk.begin(), junk.end()), "not a property list"},
      {"truncated", Data(good.begin(), good.begin() + static_cast<long>(good.size() - 3)),
       "not a property list"},
      {"not an archive", *notArchive.serialize(PropertyList::Format::Binary), "not a keyed"},
      {"array root",
       archiveOf({u"$null", Dictionary{{"NS.objects", Array{}}, {"$class", Uid{2}}},
                  classOf(u"NSArray")}),
       "NSArray"},
      {"disguised class",
       archiveOf({u"$null", dictionaryObject({}, {}, 2),
                  Dictionary{{"$classname", u"EvilDictionary"},
                             {"$classes", Array{u"EvilDictionary", u"NSDictionary"}}}}),
       "EvilDictionary"},
      {"dangling key",
       archiveOf({u"$null", dictionaryObject({Uid{40}}, {Uid{2}}, 2), classOf(u"NSDictionary")}),
       "past the object table"},
      {"nil value",
       archiveOf(
           {u"$null", dictionaryObject({Uid{3}}, {Uid{0}}, 2), classOf(u"NSDictionary"), u"key"}),
       "nil"},
      {"self cycle",
       archiveOf(
           {u"$null", dictionaryObject({Uid{3}}, {Uid{1}}, 2), classOf(u"NSDictionary"), u"key"}),
       "cycle"},
      {"number value",
       archiveOf({u"$null", dictionaryObject({Uid{3}}, {Uid{4}}, 2), classOf(u"NSDictionary"),
                  u"key", std::uint64_t{5}}),
       "not allowed"},
      {"data key",
       archiveOf(
           {u"$null", dictionaryObject({Uid{3}}, {Uid{3}}, 2), classOf(u"NSDictionary"), Data{1}}),
       "not a string"},
      {"unpaired",
       archiveOf({u"$null", dictionaryObject({Uid{3}}, {}, 2), classOf(u"NSDictionary"), u"key"}),
       "pair"},
      {"root not uid", archiveOf({u"$null"}, PropertyList(u"root")), "not a UID"},
  };
  for (const auto& c : cases) {
    std::string error;
    EXPECT_FALSE(KeyedArchive::unarchiveDictionary(c.bytes, &error)) << c.name;
    EXPECT_NE(error.find(c.reasonWord), std::string::npos) << c.name << ": " << error;
  }
  // A 100 MB item of zeros is no archive either, and is rejected without trouble.
  EXPECT_FALSE(KeyedArchive::unarchiveDictionary(Data(100 << 20, 0)));
}

TEST(Pasteboard, AddingATypeKeepsWhatIsThereAndTheRegistrySwapsBackends) {
  auto local = std::make_shared<MemoryPasteboard>();
  PlatformRegistry::setGeneralPasteboard(local);
  EXPECT_EQ(Pasteboard::general(), local);
  PasteboardItem rich;
  rich.setData(Data{1}, "com.apple.flat-rtfd");
  rich.setData(Data{2}, "public.utf8-plain-text");
  local->writeItems({rich});
  std::int64_t before = local->changeCount();
  EXPECT_TRUE(Pasteboard::general()->setData(Data{3}, "com.corvelwrks.pencildata"));
  EXPECT_GT(local->changeCount(), before);
  auto items = local->items();
  ASSERT_EQ(items.size(), 1u);
  EXPECT_EQ(items[0].types(),
            (std::vector<std::string>{"com.apple.flat-rtfd", "public.utf8-plain-text",
                                      "com.corvelwrks.pencildata"}));
  EXPECT_EQ(local->dataForType("com.apple.flat-rtfd"), Data{1});
  EXPECT_FALSE(local->dataForType("public.png"));
  local->clearContents();
  EXPECT_FALSE(local->dataForType("com.apple.flat-rtfd"));
  EXPECT_TRUE(local->setData(Data{4}, "x"));  // an empty pasteboard gets its first item
  EXPECT_EQ(local->dataForType("x"), Data{4});
  PlatformRegistry::setGeneralPasteboard(nullptr);
  EXPECT_NE(Pasteboard::general(), local);
}

}  // namespace
}  // namespace corvel
