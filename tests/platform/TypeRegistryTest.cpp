#include <gtest/gtest.h>

#include <sys/stat.h>

#include <fstream>

#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/TypeRegistry.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

TEST(TypeRegistry, ConformanceFollowsTheDeclaredHierarchy) {
  const std::tuple<const char*, const char*, bool> cases[] = {
      // Case never matters.
      {"PUBLIC.JPEG", "public.Image", true},
      // Transitive through several levels.
      {"public.utf8-plain-text", "public.item", true},
      {"net.daringfireball.markdown", "public.plain-text", true},
      // Packages are directories, not data.
      {"com.apple.rtfd", "com.apple.package", true},
      {"com.apple.rtfd", "public.data", false},
      {"com.apple.flat-rtfd", "public.data", true},
      // Never upwards, never sideways.
      {"public.text", "public.plain-text", false},
      // Unknown identifiers conform to themselves only; dynamic ones also to data and item.
      {"com.example.unknown", "com.example.unknown", true},
      {"com.example.unknown", "public.item", false},
      {"dyn.ah62d4rv4ge81g6pq", "public.item", true},
      {"dyn.ah62d4rv4ge81g6pq", "public.text", false},
      {"", "public.item", false},
  };
  TypeRegistry& types = TypeRegistry::shared();
  for (const auto& [type, parent, conforms] : cases)
    EXPECT_EQ(types.conformsTo(type, parent), conforms) << type << " -> " << parent;
}

using TagCase = std::pair<const char*, const char*>;

TEST(TypeRegistry, FilenameExtensionsAndMIMETypesFindTheirTypes) {
  const TagCase extensions[] = {
      {"JPG", "public.jpeg"}, {"md", "net.daringfireball.markdown"}, {"rtfd", "com.apple.rtfd"}};
  TypeRegistry& types = TypeRegistry::shared();
  for (const TagCase& c : extensions)
    EXPECT_EQ(types.typeForFilenameExtension(c.first), c.second) << c.first;

  EXPECT_EQ(types.typeForMIMEType("TEXT/HTML; charset=utf-8"), "public.html");
  EXPECT_EQ(types.typeForMIMEType("application/octet-stream"), "public.data");
  EXPECT_EQ(types.preferredFilenameExtension("public.jpeg"), "jpeg");
  EXPECT_EQ(types.preferredMIMEType("public.plain-text"), "text/plain");
  EXPECT_EQ(types.preferredFilenameExtension("public.text"), std::nullopt);
}

TEST(TypeRegistry, UnclaimedTagsGetDynamicIdentifiersThatRoundTrip) {
  TypeRegistry& types = TypeRegistry::shared();
  // The platform's own identifier for the extension "sql".
  EXPECT_EQ(types.typeForFilenameExtension("sql"), "dyn.ah62d4rv4ge81g6pq");
  EXPECT_EQ(types.typeForFilenameExtension("SQL"), "dyn.ah62d4rv4ge81g6pq");
  for (const char* tag : {"sql", "x", "a:b=c\\d", "", "долгое"}) {
    std::string dyn = types.typeForFilenameExtension(tag);
    EXPECT_TRUE(TypeRegistry::isDynamic(dyn)) << tag;
    EXPECT_EQ(types.preferredFilenameExtension(dyn), tag) << dyn;
    EXPECT_TRUE(types.conformsTo(dyn, "public.data"));
  }
  std::string mime = types.typeForMIMEType("application/x-corvel-test");
  EXPECT_EQ(types.preferredMIMEType(mime), "application/x-corvel-test");
  EXPECT_NE(mime, types.typeForFilenameExtension("application/x-corvel-test"));
  // Not base-32 of our alphabet: no tag, no crash.
  EXPECT_EQ(types.preferredFilenameExtension("dyn.a!!"), std::nullopt);
  EXPECT_EQ(types.preferredFilenameExtension("dyn.aiii"), std::nullopt);
}

TEST(TypeRegistry, HostDeclarationsJoinTheHierarchyWithoutStealingTags) {
  TypeRegistry types;  // private: leaves the shared registry alone
  EXPECT_FALSE(types.declare(TypeDeclaration{}));
  ASSERT_TRUE(types.declare({"ex.notes", {"net.daringfireball.markdown"}, {"note", "md"}, {}, ""}));
  EXPECT_TRUE(types.conformsTo("EX.NOTES", "public.text"));
  EXPECT_EQ(types.typeForFilenameExtension("NOTE"), "ex.notes");
  EXPECT_EQ(types.typeForFilenameExtension("md"), "net.daringfireball.markdown");
  // Declarations that loop back on themselves still answer.
  types.declare({"com.example.a", {"com.example.b"}, {}, {}, ""});
  types.declare({"com.example.b", {"com.example.a", "public.image"}, {}, {}, ""});
  EXPECT_TRUE(types.conformsTo("com.example.a", "public.data"));
  EXPECT_FALSE(types.conformsTo("com.example.a", "public.text"));
  // Redeclaring replaces: the old tag is released.
  types.declare({"ex.notes", {"public.data"}, {"note2"}, {}, ""});
  EXPECT_TRUE(TypeRegistry::isDynamic(types.typeForFilenameExtension("note")));
  EXPECT_FALSE(types.conformsTo("ex.notes", "public.text"));
  EXPECT_FALSE(TypeRegistry::shared().isDeclared("ex.notes"));
}

TEST(TypeRegistry, LoadsDeclarationsFromAPropertyListFile) {
  testing::TempDir dir;
  using D = PropertyList::Dictionary;
  using A = PropertyList::Array;
  PropertyList info(D{
      {"UTExportedTypeDeclarations",
       A{D{{"UTTypeIdentifier", u"com.example.board"},
           {"UTTypeConformsTo", A{u"public.data", u"public.composite-content"}},
           {"UTTypeTagSpecification", D{{"public.filename-extension", u"board"},
                                        {"public.mime-type", A{u"application/x-board"}}}}},
         D{{"UTTypeConformsTo", u"public.data"}},  // no identifier: skipped
         PropertyList(u"not a dictionary")}},
  });
  ASSERT_TRUE(info.writeToFile(dir.file("Info.plist"), PropertyList::Format::Binary));
  TypeRegistry types;
  EXPECT_EQ(types.loadDeclarations(dir.file("Info.plist")), 1u);
  EXPECT_EQ(types.typeForFilenameExtension("board"), "com.example.board");
  EXPECT_EQ(types.typeForMIMEType("application/x-board"), "com.example.board");
  EXPECT_TRUE(types.conformsTo("com.example.board", "public.content"));

  std::ofstream(dir.file("junk.plist")) << "not a property list";
  EXPECT_EQ(types.loadDeclarations(dir.file("junk.plist")), std::nullopt);
  ASSERT_TRUE(PropertyList(D{{"CFBundleName", u"x"}})
                  .writeToFile(dir.file("other.plist"), PropertyList::Format::XML));
  EXPECT_EQ(types.loadDeclarations(dir.file("other.plist")), std::nullopt);
}

TEST(TypeOfFile, NamesFilesByExtensionAndDirectoriesByKind) {
  testing::TempDir dir;
  for (const char* name : {"a.PNG", ".hidden", "trail."}) std::ofstream(dir.file(name)) << "x";
  for (const char* name : {"Doc.rtfd", "photos.png"})
    ASSERT_EQ(::mkdir(dir.file(name).c_str(), 0755), 0);
  const TagCase cases[] = {
      {"a.PNG", "public.png"},
      {".hidden", "public.data"},
      {"trail.", "public.data"},
      {"Doc.rtfd", "com.apple.rtfd"},
      {"Doc.rtfd/", "com.apple.rtfd"},
      {"photos.png", "public.folder"},  // only package extensions name a directory
  };
  for (const TagCase& c : cases) EXPECT_EQ(typeOfFile(dir.file(c.first)), c.second) << c.first;
  EXPECT_EQ(typeOfFile(dir.file("missing.txt")), std::nullopt);
  EXPECT_EQ(typeOfFile(""), std::nullopt);
}

}  // namespace
}  // namespace corvel
