#include <gtest/gtest.h>

#include <functional>

#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/PropertyList.h"

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

// A dictionary (object 1, its class object 2) with the given key and value references;
// `more` follows from object 3 on.
Data dictionaryArchive(Array keys, Array values, Array more = {},
                       PropertyList cls = classOf(u"NSDictionary")) {
  Array objects{u"$null", dictionaryObject(std::move(keys), std::move(values), 2), cls};
  objects.insert(objects.end(), more.begin(), more.end());
  return archiveOf(std::move(objects));
}

// The platform's unarchiver expects exactly this layout, object numbers included.
TEST(KeyedArchive, RoundTripsAndHasThePlatformStructure) {
  auto bytes = KeyedArchive::archiveDictionary(kStrokes);
  ASSERT_TRUE(bytes);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*bytes), kStrokes);
  EXPECT_EQ(KeyedArchive::unarchiveDictionary(*KeyedArchive::archiveDictionary({})),
            StringDataDictionary{});

  auto plist = PropertyList::deserialize(*bytes);
  ASSERT_TRUE(plist);
  EXPECT_EQ(*plist->find("$archiver"), PropertyList(u"NSKeyedArchiver"));
  EXPECT_EQ(plist->find("$version")->unsignedIntegerValue(), 100000u);
  EXPECT_EQ(*plist->find("$top"), PropertyList(Dictionary{{"root", Uid{1}}}));
  const Array& objects = *plist->find("$objects")->array();
  EXPECT_EQ(objects[0], PropertyList(u"$null"));
  // Keys are encoded before values, and the class description comes last.
  EXPECT_EQ(objects[1], dictionaryObject({Uid{2}, Uid{3}, Uid{4}}, {Uid{5}, Uid{6}, Uid{7}}, 8));
  EXPECT_EQ(objects[8],
            PropertyList(Dictionary{
                {"$classname", u"NSMutableDictionary"},
                {"$classes", Array{u"NSMutableDictionary", u"NSDictionary", u"NSObject"}}}));
}

TEST(KeyedArchive, ReadsTheOtherFormsThePlatformWrites) {
  // Immutable dictionary, mutable data and string objects, and an XML property list.
  Data binary = dictionaryArchive(
      {Uid{3}}, {Uid{5}},
      {Dictionary{{"NS.string", u"key"}, {"$class", Uid{4}}}, classOf(u"NSMutableString"),
       Dictionary{{"NS.data", Data{9, 8, 7}}, {"$class", Uid{6}}}, classOf(u"NSMutableData")});
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
  PropertyList notArchive = Dictionary{{"$objects", Array{u"$null"}}};
  struct Case {
    const char* name;
    Data bytes;
    const char* reasonWord;
  } cases[] = {
      // Not a keyed archive at all.
      {"empty", {}, "not a property list"},
      {"not an archive", *notArchive.serialize(PropertyList::Format::Binary), "not a keyed"},
      {"root not uid", archiveOf({u"$null"}, PropertyList(u"root")), "not a UID"},
      // Classes outside the allowed few, however they are dressed up.
      {"array root", dictionaryArchive({}, {}, {}, classOf(u"NSArray")), "NSArray"},
      {"disguised class",
       dictionaryArchive({}, {}, {},
                         Dictionary{{"$classname", u"EvilDictionary"},
                                    {"$classes", Array{u"EvilDictionary", u"NSDictionary"}}}),
       "EvilDictionary"},
      // References that lead nowhere or back, and entries of the wrong kind.
      {"dangling key", dictionaryArchive({Uid{40}}, {Uid{2}}), "past the object table"},
      {"self cycle", dictionaryArchive({Uid{3}}, {Uid{1}}, {u"key"}), "cycle"},
      {"number value", dictionaryArchive({Uid{3}}, {Uid{4}}, {u"key", std::uint64_t{5}}),
       "not allowed"},
      {"data key", dictionaryArchive({Uid{3}}, {Uid{3}}, {Data{1}}), "not a string"},
      {"unpaired", dictionaryArchive({Uid{3}}, {}, {u"key"}), "pair"},
  };
  for (const auto& c : cases) {
    std::string error;
    EXPECT_FALSE(KeyedArchive::unarchiveDictionary(c.bytes, &error)) << c.name;
    EXPECT_NE(error.find(c.reasonWord), std::string::npos) << c.name << ": " << error;
  }
  // A large item of zeros is no archive either, and is rejected without trouble.
  EXPECT_FALSE(KeyedArchive::unarchiveDictionary(Data(4 << 20, 0)));
}

// Hosts poll the count to notice new contents. Adding a type beside the others, and
// swapping the general pasteboard, are walked by the drawings' copy and paste.
TEST(Pasteboard, EveryChangeCounts) {
  MemoryPasteboard board;
  std::int64_t before = board.changeCount();
  EXPECT_TRUE(board.setData(Data{3}, "com.corvelwrks.pencildata"));
  EXPECT_GT(board.changeCount(), before);
  EXPECT_GT(board.clearContents(), before + 1);
  EXPECT_FALSE(board.dataForType("com.corvelwrks.pencildata"));
}

}  // namespace
}  // namespace corvel
