// Pasteboard items and bundles that no well-behaved program writes.
#include <gtest/gtest.h>

#include <filesystem>

#include "Corvelbase/PencilDrawings.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/RTFD.h"
#include "tests/attachments/PencilTestSupport.h"

namespace corvel {
namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Uid = PropertyList::Uid;

Data archiveOf(Array objects) {
  PropertyList archive = Dictionary{{"$archiver", u"NSKeyedArchiver"},
                                    {"$version", std::uint64_t{100000}},
                                    {"$top", Dictionary{{"root", Uid{1}}}},
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

TEST(PencilDrawingsHostile, PasteboardItemsThatAreNoDrawingsGiveNothing) {
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  Data good = *KeyedArchive::archiveDictionary({{"K", {1, 2, 3}}});
  Data huge(100u << 20, 0xFF);
  std::copy_n("bplist00", 8, huge.begin());
  struct Case {
    const char* name;
    Data item;
  } cases[] = {
      {"empty", {}},
      {"text", {'h', 'e', 'l', 'l', 'o'}},
      {"truncated", Data(good.begin(), good.end() - 5)},
      {"header only", Data(good.begin(), good.begin() + 8)},
      {"array root", archiveOf({u"$null", Dictionary{{"NS.objects", Array{}}, {"$class", Uid{2}}},
                                classOf(u"NSArray")})},
      {"number value", archiveOf({u"$null", dictionaryObject({Uid{3}}, {Uid{4}}, 2),
                                  classOf(u"NSDictionary"), u"K", std::uint64_t{5}})},
      {"foreign class", archiveOf({u"$null", dictionaryObject({}, {}, 2),
                                   Dictionary{{"$classname", u"NSURL"},
                                              {"$classes", Array{u"NSURL", u"NSDictionary"}}}})},
      {"cycle", archiveOf({u"$null", dictionaryObject({Uid{3}}, {Uid{1}}, 2),
                           classOf(u"NSDictionary"), u"K"})},
      {"dangling", archiveOf({u"$null", dictionaryObject({Uid{3}}, {Uid{99}}, 2),
                              classOf(u"NSDictionary"), u"K"})},
      {"100 MB of junk", std::move(huge)},
  };
  AttributedString text;
  for (const auto& c : cases) {
    pastedPencilDataDictionary = PencilDataDictionary{{"before", {0}}};
    pasteboard->clearContents();
    ASSERT_TRUE(pasteboard->setData(c.item, RVPencilPasteboardData)) << c.name;
    text.checkForPencilDataOnPaste();
    EXPECT_FALSE(pastedPencilDataDictionary) << c.name;
  }
  EXPECT_TRUE(log.lines().empty());  // dropped silently
}

TEST(PencilDrawingsHostile, ALargeDrawingTravelsWhole) {
  testing::ScopedPasteboard pasteboard;
  Data strokes = testing::makeStrokes(16u << 20, 9);
  AttributedString text;
  text.addPencilDataToClipboard(PencilDataDictionary{{"BIG", strokes}});
  pastedPencilDataDictionary.reset();
  text.checkForPencilDataOnPaste();
  ASSERT_TRUE(pastedPencilDataDictionary);
  ASSERT_EQ(pastedPencilDataDictionary->size(), 1u);
  EXPECT_TRUE(pastedPencilDataDictionary->at("BIG") == strokes);
  pastedPencilDataDictionary.reset();
}

// A bundle written by hand: TXT.rtf naming `names` in turn, and the given files.
std::string makeBundle(const testing::TempDir& dir, const std::vector<std::string>& names,
                       const std::vector<std::pair<std::string, Data>>& files) {
  std::string bundle = dir.file("doc.rtfd");
  std::filesystem::create_directories(bundle);
  std::string rtf = "{\\rtf1\\ansi\\ansicpg1252 text";
  for (const auto& name : names)
    rtf += "{{\\NeXTGraphic " + name + " \\width20 \\height20\n}\\'ac}";
  rtf += "}";
  EXPECT_TRUE(writeFileAtomically(bundle + "/TXT.rtf", Data(rtf.begin(), rtf.end())));
  for (const auto& [name, bytes] : files)
    EXPECT_TRUE(writeFileAtomically(bundle + "/" + name, bytes));
  return bundle;
}

TEST(PencilDrawingsHostile, BundlesGiveOnlyTheDrawingsTheyReallyHold) {
  testing::TempDir outside;
  ASSERT_TRUE(writeFileAtomically(outside.file("secret.pencildata"), Data{6, 6, 6}));
  struct Case {
    const char* name;
    std::vector<std::string> named;
    std::vector<std::pair<std::string, Data>> files;
    std::function<void(const std::string& bundle)> tamper;
    PencilDataDictionary expected;  // identifier to the bytes its wrapper holds
    std::size_t attachmentsLeft;
  } cases[] = {
      {"well formed",
       {"A.jpeg", "A.pencildata"},
       {{"A.jpeg", {1}}, {"A.pencildata", {2}}},
       nullptr,
       {{"A", {2}}},
       1},
      {"named but missing", {"M.pencildata"}, {}, nullptr, {}, 1},
      {"leading outside", {"../secret.pencildata"}, {}, nullptr, {}, 1},
      {"a link outside",
       {"L.pencildata"},
       {},
       [&](const std::string& bundle) {
         std::filesystem::create_symlink(outside.file("secret.pencildata"),
                                         bundle + "/L.pencildata");
       },
       {},
       1},
      {"a directory",
       {"D.pencildata"},
       {},
       [](const std::string& bundle) {
         std::filesystem::create_directories(bundle + "/D.pencildata/inner");
       },
       {{"D", {}}},
       0},  // taken by its name; it holds no stroke bytes
      {"upper case", {"U.PENCILDATA"}, {{"U.PENCILDATA", {3}}}, nullptr, {}, 1},
      {"no extension", {".pencildata"}, {{".pencildata", {4}}}, nullptr, {}, 1},
      {"named twice",
       {"S.pencildata", "S.pencildata"},
       {{"S.pencildata", {5}}},
       nullptr,
       {{"S", {5}}},
       0},
  };
  for (const auto& c : cases) {
    testing::TempDir dir;
    std::string bundle = makeBundle(dir, c.named, c.files);
    if (c.tamper) c.tamper(bundle);
    auto text = attributedStringWithContentsOfRTFD(bundle);
    ASSERT_TRUE(text) << c.name;
    std::uint64_t length = text->length();
    auto drawings = text->removePencilAttachments();
    PencilDataDictionary found;
    for (const auto& [identifier, attachment] : drawings) {
      auto wrapper = attachment->fileWrapper();
      found[identifier] = wrapper->regularFileContents().value_or(Data{});
    }
    EXPECT_EQ(found, c.expected) << c.name;
    EXPECT_EQ(text->length(), length) << c.name;
    std::size_t left = 0;
    for (std::uint64_t i = 0; i < text->length(); ++i)
      left += text->attachmentAtIndex(i) != nullptr;
    EXPECT_EQ(left, c.attachmentsLeft) << c.name;
  }
}

TEST(PencilDrawingsHostile, ACutBundleStillLoadsWhatItHolds) {
  testing::TempDir dir;
  std::string bundle = makeBundle(dir, {"A.pencildata", "B.pencildata"},
                                  {{"A.pencildata", {1}}, {"B.pencildata", {2}}});
  // Cut TXT.rtf at every length: the drawings fully named before the cut come out, and
  // the rest is plain text.
  Data rtf = *readFile(bundle + "/TXT.rtf");
  for (std::size_t size = 0; size <= rtf.size(); ++size) {
    ASSERT_TRUE(writeFileAtomically(bundle + "/TXT.rtf", Data(rtf.begin(), rtf.begin() + size)));
    auto text = attributedStringWithContentsOfRTFD(bundle);
    if (!text) continue;  // too short to be RTF at all
    auto drawings = text->removePencilAttachments();
    EXPECT_LE(drawings.size(), 2u) << size;
    if (size == rtf.size()) {
      EXPECT_EQ(drawings.size(), 2u);
    }
    for (const auto& [identifier, attachment] : drawings)
      EXPECT_TRUE(identifier == "A" || identifier == "B") << size;
  }
}

}  // namespace
}  // namespace corvel
