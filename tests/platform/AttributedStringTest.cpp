#include <gtest/gtest.h>

#include "Corvelbase/platform/AttributedString.h"
#include "Corvelbase/platform/TextAttachment.h"

namespace corvel {
namespace {

const std::string kBold = "bold";
const std::string kColor = "color";
using Runs = std::vector<std::string>;

AttributedString attached(std::shared_ptr<TextAttachment> a) {
  return AttributedString::attributedStringWithAttachment(std::move(a));
}

// The per-character model of an attributed string: what attributes each unit carries.
// Expected values are built from it, independently of the run bookkeeping under test.
std::vector<Attributes> perCharacter(const AttributedString& s) {
  std::vector<Attributes> out;
  for (std::uint64_t i = 0; i < s.length(); ++i) out.push_back(s.attributesAtIndex(i, nullptr));
  return out;
}

// Runs as the enumeration reports them, as "start+length" strings.
Runs runs(const AttributedString& s) {
  Runs out;
  s.enumerateAttributesInRange(Range{0, s.length()}, 0, [&](const Attributes&, Range r, bool*) {
    out.push_back(std::to_string(r.location) + "+" + std::to_string(r.length));
  });
  return out;
}

// Runs of one attribute in `range`, starred where it is set; the walk stops after the
// first starred run when `stopAtValue`.
Runs runsOf(const AttributedString& s, const std::string& name, Range range,
            std::uint32_t options = 0, bool stopAtValue = false) {
  Runs seen;
  s.enumerateAttribute(name, range, options, [&](const AttributeValue* v, Range r, bool* stop) {
    seen.push_back(std::to_string(r.location) + "+" + std::to_string(r.length) + (v ? "*" : ""));
    *stop = stopAtValue && v;
  });
  return seen;
}

TEST(AttributedString, EditsMatchAPerCharacterModel) {
  // Each step edits the string and a plain vector model the same way; after every step the
  // attributes of every character must agree and the runs must be maximal.
  AttributedString s(u"abcdefghij");
  std::vector<Attributes> model(10);
  auto apply = [&](bool done, Range r, auto edit) {
    ASSERT_TRUE(done);
    for (auto i = r.location; i < r.max(); ++i) edit(model[i]);
  };
  apply(s.addAttribute(kBold, true, Range{2, 5}), Range{2, 5},
        [](Attributes& a) { a[kBold] = true; });
  apply(s.addAttribute(kColor, String(u"red"), Range{4, 6}), Range{4, 6},
        [](Attributes& a) { a[kColor] = String(u"red"); });
  apply(s.removeAttribute(kBold, Range{3, 2}), Range{3, 2}, [](Attributes& a) { a.erase(kBold); });
  apply(s.setAttributes({{kColor, std::int64_t{7}}}, Range{0, 1}), Range{0, 1}, [](Attributes& a) {
    a = {{kColor, std::int64_t{7}}};
  });
  EXPECT_EQ(perCharacter(s), model);
  EXPECT_EQ(runs(s), (Runs{"0+1", "1+1", "2+1", "3+1", "4+1", "5+2", "7+3"}));

  // Removing what made runs differ merges them again.
  ASSERT_TRUE(s.setAttributes({}, Range{0, 10}));
  EXPECT_EQ(runs(s), (Runs{"0+10"}));
}

TEST(AttributedString, ReplacedTextTakesTheAttributesOfTheTextItJoins) {
  struct Case {
    const char* name;
    Range range;
    const char16_t* text;
    const char16_t* expected;
    bool bold;  // whether the character at the range's start now carries "bold"
  } cases[] = {
      // "ab" plain, "CD" bold, "ef" plain.
      {"replace inside bold", {2, 1}, u"xy", u"abxyDef", true},
      {"insert after bold", {4, 0}, u"z", u"abCDzef", true},
      {"insert at start takes the first character's", {0, 0}, u"z", u"zabCDef", false},
      {"insert after plain", {2, 0}, u"z", u"abzCDef", false},
      {"delete", {1, 3}, u"", u"aef", false},
  };
  for (const auto& c : cases) {
    AttributedString s(u"abCDef");
    s.addAttribute(kBold, true, Range{2, 2});
    ASSERT_TRUE(s.replaceCharactersInRange(c.range, String(c.text))) << c.name;
    EXPECT_EQ(s.string(), c.expected) << c.name;
    EXPECT_EQ(s.attribute(kBold, c.range.location, nullptr).has_value(), c.bold) << c.name;
  }
}

TEST(AttributedString, OutOfBoundsRangesHaveDefinedAnswers) {
  AttributedString s(u"hello", {{kBold, true}});
  const AttributedString before = s;
  const Range bad[] = {{5, 1}, {6, 0}, {NotFound, 0}, {2, UINT64_MAX}, {UINT64_MAX, 2}};
  for (const auto& r : bad) {
    EXPECT_FALSE(s.addAttribute(kColor, true, r)) << r.location << "," << r.length;
    EXPECT_FALSE(s.removeAttribute(kBold, r));
    EXPECT_FALSE(s.setAttributes({}, r));
    EXPECT_FALSE(s.replaceCharactersInRange(r, String(u"x")));
    EXPECT_FALSE(s.deleteCharactersInRange(r));
    EXPECT_EQ(s, before);
  }
  EXPECT_FALSE(s.insertAttributedString(AttributedString(u"x"), 6));
  // Readers clamp: an index past the end has nothing; enumeration stops at the end.
  Range effective{1, 1};
  EXPECT_TRUE(s.attributesAtIndex(5, &effective).empty());
  EXPECT_EQ(effective, NotFoundRange);
  EXPECT_EQ(s.attributedSubstringFromRange(Range{3, 100}).string(), u"lo");
  EXPECT_EQ(s.attributedSubstringFromRange(Range{UINT64_MAX, UINT64_MAX}).length(), 0u);
  EXPECT_EQ(runsOf(s, kBold, Range{4, UINT64_MAX}), Runs{"4+1*"});
}

TEST(AttributedString, EnumerationMergesOneAttributeUnlessAskedNotTo) {
  auto a = TextAttachment::init();
  AttributedString s(u"ab");
  s.appendAttributedString(attached(a));
  s.appendAttributedString(attached(a));
  s.appendAttributedString(AttributedString(u"cd"));
  s.addAttribute(kBold, true, Range{0, 1});
  ASSERT_EQ(s.string(), u"ab\uFFFC\uFFFCcd");

  const Range all{0, 6};
  EXPECT_EQ(runsOf(s, AttachmentAttributeName, all), (Runs{"0+2", "2+2*", "4+2"}));
  // Without longest ranges, "a" (bold) and "b" come one run at a time.
  EXPECT_EQ(runsOf(s, AttachmentAttributeName, all,
                   AttributedStringEnumerationLongestEffectiveRangeNotRequired)
                .size(),
            4u);
  EXPECT_EQ(runsOf(s, AttachmentAttributeName, all, AttributedStringEnumerationReverse, true),
            (Runs{"4+2", "2+2*"}));
  EXPECT_EQ(s.attachmentAtIndex(3), a);
  Range longest;
  s.attribute(AttachmentAttributeName, 3, &longest, Range{3, 3});
  EXPECT_EQ(longest, (Range{3, 1}));
}

TEST(AttributedString, TheBlockMayEditTheStringItEnumerates) {
  // Removing attachments while walking them, back to front, as drawing code does.
  AttributedString s;
  for (int i = 0; i < 3; ++i) {
    s.appendAttributedString(AttributedString(u"x"));
    s.appendAttributedString(attached(TextAttachment::init()));
  }
  s.enumerateAttribute(AttachmentAttributeName, Range{0, s.length()}, 0,
                       [&](const AttributeValue* v, Range r, bool*) {
                         if (v) s.removeAttribute(AttachmentAttributeName, r);
                       });
  EXPECT_EQ(s.string(), u"x\uFFFCx\uFFFCx\uFFFC");
  EXPECT_EQ(runs(s), (Runs{"0+6"}));
}

TEST(AttributedString, BatchesDeferMergingAndAttachmentsCompareByIdentity) {
  AttributedString s(u"abcdef");
  s.beginEditing();
  s.beginEditing();
  s.addAttribute(kBold, true, Range{0, 3});
  s.addAttribute(kBold, true, Range{3, 3});
  s.endEditing();
  // Results inside the batch are already the merged ones.
  EXPECT_EQ(runs(s), (Runs{"0+6"}));
  EXPECT_EQ(s, AttributedString(u"abcdef", {{kBold, true}}));
  s.endEditing();
  s.endEditing();  // unmatched: nothing happens
  EXPECT_FALSE(s.isEditing());

  auto a = TextAttachment::initWithData(Data{1, 2}, "public.data");
  auto b = TextAttachment::initWithData(Data{1, 2}, "public.data");
  EXPECT_EQ(attached(a), attached(a));
  EXPECT_NE(attached(a), attached(b));
}

}  // namespace
}  // namespace corvel
