#include <gtest/gtest.h>

#include <fstream>

#include "support/TestSupport.h"

namespace corvel {
namespace {

// A file `name` in `dir` holding `text`, its path quoted for the shell.
std::string file(const testing::TempDir& dir, const std::string& name, const std::string& text) {
  std::ofstream(dir.file(name)) << text;
  return "'" + dir.file(name) + "'";
}

TEST(StringCommands, UtiLangAndHeaderPrintTheAnswerOrExitWithWhy) {
  testing::TempDir dir;
  std::string notes = file(dir, "notes.MD", "# x");
  std::string de = file(dir, "de.txt",
                        "Wir haben das ganze Wochenende den Dachboden aufgeräumt und alte Briefe "
                        "gefunden.");
  std::string digits = file(dir, "digits.txt", "1234 5678 90");
  std::string bad = file(dir, "bad.txt", "\xff\xfe\x80 \xc3"), missing = "'" + dir.file("no") + "'";
  std::string mail =
      file(dir, "m.eml", "From: Ada Lovelace <ada@example.com>\r\nSubject: Grüße\r\n\r\nBody\r\n");
  // `corvel ARGUMENTS` (which may redirect standard input): its exit status and standard output.
  const struct {
    std::string arguments;
    int status;
    std::string output;
  } cases[] = {
      // uti: the type, then everything it conforms to.
      {"uti public.png", 0, "public.png\npublic.image\npublic.data\npublic.content\npublic.item\n"},
      {"uti " + notes, 0,
       "net.daringfireball.markdown\npublic.plain-text\npublic.text\npublic.data\n"
       "public.content\npublic.item\n"},
      {"uti com.example.unknown", 0, "com.example.unknown\n"},
      {"uti", 2, ""},
      // lang: the code from a file or standard input; 1 when undetermined.
      {"lang " + de, 0, "de\n"},
      {"lang < " + de, 0, "de\n"},
      {"lang " + digits, 1, ""},
      {"lang " + bad, 1, ""},
      {"lang " + missing, 2, ""},
      {"lang --fast", 2, ""},
      // header: the value, or with --address the address; 1 when there is none.
      {"header subject " + mail, 0, "Grüße\n"},
      {"header --address From < " + mail, 0, "ada@example.com\n"},
      {"header Subject --address " + mail, 1, ""},
      {"header From " + mail + " extra", 2, ""},
      {"header From " + missing, 2, ""},
  };
  for (const auto& c : cases) {
    auto result = testing::corvel(c.arguments + " 2>/dev/null");
    EXPECT_EQ(result.status, c.status) << c.arguments;
    EXPECT_EQ(result.output, c.output) << c.arguments;
  }
}

}  // namespace
}  // namespace corvel
