#include <gtest/gtest.h>

#include "Corvelbase/UTI.h"
#include "Corvelbase/platform/TypeRegistry.h"

namespace corvel {
namespace {

TEST(UTI, ConformanceAndEqualityGoThroughTheValidStringNilAnswersNo) {
  const struct {
    const char16_t *uti, *other;
    bool conforms, equal;
  } cases[] = {
      // Clippings count as the unknown item kind, on either side.
      {u"com.apple.finder.textclipping", u"COM.CORVELWORKS.TESSEL.UNKNOWN", true, true},
      {u"com.corvelworks.tessel.unknown", u"com.apple.finder.pictclipping", true, true},
      {u"com.apple.finder.textclipping", u"public.text", false, false},
      {u"com.apple.finder.textclipping", u"public.item", true, false},
      // The clipping test is exact: another case is just an unknown identifier.
      {u"COM.APPLE.FINDER.TEXTCLIPPING", u"com.corvelworks.tessel.unknown", false, false},
      // The types the library declares for its own documents.
      {u"com.corvelworks.tessel.formattednote", u"public.content", true, false},
      {u"com.corvelworks.tessel.database", u"public.content", false, false},
      // Empty identifiers are equal, like any two equal strings.
      {u"", u"", true, true},
  };
  for (const auto& c : cases) {
    String uti(c.uti), other(c.other);
    std::string what = toUTF8(uti) + " / " + toUTF8(other);
    EXPECT_EQ(UTI::conformsToUTI(uti, other), c.conforms) << what;
    EXPECT_EQ(UTI::conformsToUTIString(uti, other), c.conforms) << what;
    EXPECT_EQ(UTI::isEqualToUTI(uti, other), c.equal) << what;
    EXPECT_EQ(UTI::isEqualToUTIString(uti, other), c.equal) << what;
    // A nil other answers no, whatever the first.
    EXPECT_FALSE(UTI::conformsToUTI(uti, std::nullopt) ||
                 UTI::conformsToUTIString(uti, std::nullopt) ||
                 UTI::isEqualToUTI(uti, std::nullopt) || UTI::isEqualToUTIString(uti, std::nullopt))
        << what;
  }
}

TEST(UTI, DynamicAndRTFKind) {
  const std::tuple<const char16_t*, bool, bool> cases[] = {
      {u"dyn.", true, false},           {u"DYN.ah62d4rv4ge81g6pq", false, false},
      {u"dyn", false, false},           {u"PUBLIC.RTF", false, true},
      {u"com.apple.rtfd", false, true}, {u"com.apple.flat-rtfd", false, false},
  };
  for (const auto& [uti, dynamic, rtfKind] : cases) {
    EXPECT_EQ(UTI::isDynamicUTI(uti), dynamic) << toUTF8(uti);
    EXPECT_EQ(UTI::isRTFKindUTI(uti), rtfKind) << toUTF8(uti);
  }
  // A host type that conforms to RTF is still no RTF kind.
  TypeRegistry::shared().declare({"com.example.rtf-flavour", {"public.rtf"}, {}, {}, ""});
  EXPECT_TRUE(UTI::conformsToUTI(u"com.example.rtf-flavour", String(u"public.rtf")));
  EXPECT_FALSE(UTI::isRTFKindUTI(u"com.example.rtf-flavour"));
}

}  // namespace
}  // namespace corvel
