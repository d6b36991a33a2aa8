// Pasteboard items and bundles that no well-behaved program writes.
#include <gtest/gtest.h>

#include <functional>

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

// An archive whose root dictionary maps "K" to `value` (through `reference`), its class
// described by `classes`.
Data archiveWith(PropertyList value, Array classes = {u"NSDictionary", u"NSObject"},
                 Uid reference = Uid{4}) {
  Array objects{
      u"$null",
      Dictionary{{"NS.keys", Array{Uid{3}}}, {"NS.objects", Array{reference}}, {"$class", Uid{2}}},
      Dictionary{{"$classname", classes[0]}, {"$classes", classes}}, u"K", std::move(value)};
  PropertyList archive = Dictionary{{"$archiver", u"NSKeyedArchiver"},
                                    {"$version", std::uint64_t{100000}},
                                    {"$top", Dictionary{{"root", Uid{1}}}},
                                    {"$objects", std::move(objects)}};
  return *archive.serialize(PropertyList::Format::Binary);
}

TEST(PencilDrawingsHostile, PasteboardItemsThatAreNoDrawingsAreDroppedSilently) {
  testing::ScopedPasteboard pasteboard;
  testing::LogCapture log;
  Data good = archiveWith(Data{1, 2});
  Data huge(100u << 20, 0xFF);  // 100 MB that claims to be a binary property list
  std::copy_n("bplist00", 8, huge.begin());
  struct Case {
    const char* name;
    Data item;
  } cases[] = {
      {"text", {'h', 'i'}},
      {"truncated", Data(good.begin(), good.end() - 5)},
      {"number value", archiveWith(std::uint64_t{5})},
      {"foreign class", archiveWith(Data{1}, {u"NSURL", u"NSDictionary"})},
      {"cycle", archiveWith(Data{1}, {u"NSDictionary"}, Uid{1})},
      {"dangling", archiveWith(Data{1}, {u"NSDictionary"}, Uid{99})},
      {"100 MB", std::move(huge)},
  };
  AttributedString text;
  ASSERT_TRUE(pasteboard->setData(good, RVPencilPasteboardData));
  text.checkForPencilDataOnPaste();
  EXPECT_EQ(pastedPencilDataDictionary, (PencilDataDictionary{{"K", {1, 2}}}));
  for (const auto& c : cases) {
    pastedPencilDataDictionary = PencilDataDictionary{{"before", {0}}};
    ASSERT_TRUE(pasteboard->setData(c.item, RVPencilPasteboardData));
    text.checkForPencilDataOnPaste();
    EXPECT_FALSE(pastedPencilDataDictionary) << c.name;
  }
  // No item at all leaves the last dictionary alone.
  pasteboard->clearContents();
  pastedPencilDataDictionary = PencilDataDictionary{};
  text.checkForPencilDataOnPaste();
  EXPECT_EQ(pastedPencilDataDictionary, PencilDataDictionary{});
  EXPECT_TRUE(log.lines().empty());
}

TEST(PencilDrawingsHostile, BundlesGiveOnlyTheDrawingsTheyReallyHold) {
  testing::TempDir outside;
  ASSERT_TRUE(writeFileAtomically(outside.file("secret.pencildata"), Data{6}));
  struct Case {
    const char* name;
    std::vector<std::string> named;  // in TXT.rtf, in turn
    std::function<void(const std::string& bundle)> make;
    PencilDataDictionary expected;  // identifier to the bytes its wrapper holds
    std::size_t attachmentsLeft;
  } cases[] = {
      {"well formed",
       {"A.jpeg", "A.pencildata"},
       [](auto& b) { writeFileAtomically(b + "/A.pencildata", Data{2}); },
       {{"A", {2}}},
       1},
      {"named but missing", {"M.pencildata"}, nullptr, {}, 1},
      {"leading outside", {"../secret.pencildata"}, nullptr, {}, 1},
      {"a link outside",
       {"L.pencildata"},
       [&](auto& b) {
         std::filesystem::create_symlink(outside.file("secret.pencildata"), b + "/L.pencildata");
       },
       {},
       1},
      {"a directory",
       {"D.pencildata"},
       [](auto& b) { std::filesystem::create_directories(b + "/D.pencildata/inner"); },
       {{"D", {}}},
       0},  // taken by its name, though it holds no stroke bytes
      {"upper case",
       {"U.PENCILDATA"},
       [](auto& b) { writeFileAtomically(b + "/U.PENCILDATA", Data{3}); },
       {},
       1},
      {"named twice",
       {"S.pencildata", "S.pencildata"},
       [](auto& b) { writeFileAtomically(b + "/S.pencildata", Data{5}); },
       {{"S", {5}}},
       0},
  };
  for (const auto& c : cases) {
    testing::TempDir dir;
    std::string bundle = dir.file("doc.rtfd");
    std::filesystem::create_directories(bundle);
    std::string rtf = "{\\rtf1\\ansi\\ansicpg1252 text";
    for (const auto& name : c.named)
      rtf += "{{\\NeXTGraphic " + name + " \\width20 \\height20\n}\\'ac}";
    ASSERT_TRUE(writeFileAtomically(bundle + "/TXT.rtf", Data(rtf.begin(), rtf.end())));
    if (c.make) c.make(bundle);
    auto text = attributedStringWithContentsOfRTFD(bundle);
    ASSERT_TRUE(text) << c.name;
    std::uint64_t length = text->length();
    PencilDataDictionary found;
    for (const auto& [identifier, attachment] : text->removePencilAttachments())
      found[identifier] = attachment->fileWrapper()->regularFileContents().value_or(Data{});
    EXPECT_EQ(found, c.expected) << c.name;
    EXPECT_EQ(text->length(), length) << c.name;
    std::size_t left = 0;
    for (std::uint64_t i = 0; i < length; ++i) left += text->attachmentAtIndex(i) != nullptr;
    EXPECT_EQ(left, c.attachmentsLeft) << c.name;
  }
}

}  // namespace
}  // namespace corvel
