// Path pieces: every caller that names, types or identifies a file by its path reads
// these, so a trailing slash or a leading dot must mean the same thing everywhere.
#include <gtest/gtest.h>

#include "Corvelbase/platform/Files.h"

namespace corvel {
namespace {

TEST(PathPieces, TrailingSlashesAndLeadingDotsAsThePlatformTakesThem) {
  struct Case {
    const char* path;
    const char* last;
    const char* extension;
    const char* deleted;
  } cases[] = {
      // Ordinary names.
      {"/x/y.d/C.jpeg", "C.jpeg", "jpeg", "/x/y.d/C"},
      {"a.tar.gz", "a.tar.gz", "gz", "a.tar"},
      {"noext", "noext", "", "noext"},
      // Trailing slashes are ignored.
      {"/x/R.pencildata/", "R.pencildata", "pencildata", "/x/R"},
      {"b.txt///", "b.txt", "txt", "b"},
      {"/", "/", "", "/"},
      {"", "", "", ""},
      // A dot that starts a component begins no extension; a dot in a folder name is no
      // extension of the file.
      {".hidden", ".hidden", "", ".hidden"},
      {"/x/.pencildata", ".pencildata", "", "/x/.pencildata"},
      {"y.d/file", "file", "", "y.d/file"},
      {"a.", "a.", "", "a"},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(lastPathComponent(c.path), c.last) << c.path;
    EXPECT_EQ(pathExtension(c.path), c.extension) << c.path;
    EXPECT_EQ(deletingPathExtension(c.path), c.deleted) << c.path;
  }
}

}  // namespace
}  // namespace corvel
