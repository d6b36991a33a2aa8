#include <gtest/gtest.h>

#include <fstream>

#include "support/TestSupport.h"

namespace corvel {
namespace {

struct CommandCase {
  std::string arguments;  // after the program name; may redirect standard input
  int status;
  std::string output;
};

void runCases(const std::vector<CommandCase>& cases) {
  for (const CommandCase& c : cases) {
    testing::CommandResult result =
        testing::runCommand(std::string(CORVEL_TOOL_PATH) + " " + c.arguments + " 2>/dev/null");
    EXPECT_EQ(result.status, c.status) << c.arguments;
    EXPECT_EQ(result.output, c.output) << c.arguments;
  }
}

TEST(StringCommands, UtiPrintsTheTypeAndEverythingItConformsTo) {
  testing::TempDir dir;
  std::ofstream(dir.file("notes.MD")) << "# x";
  runCases({
      {"uti public.png", 0, "public.png\npublic.image\npublic.data\npublic.content\npublic.item\n"},
      {"uti '" + dir.file("notes.MD") + "'", 0,
       "net.daringfireball.markdown\npublic.plain-text\npublic.text\npublic.data\n"
       "public.content\npublic.item\n"},
      {"uti '" + dir.path() + "'", 0, "public.folder\npublic.directory\npublic.item\n"},
      {"uti com.example.unknown", 0, "com.example.unknown\n"},
      {"uti", 2, ""},
      {"uti a b", 2, ""},
      {"uti ''", 2, ""},
  });
}

TEST(StringCommands, LangPrintsTheCodeOrNothing) {
  testing::TempDir dir;
  std::ofstream(dir.file("de.txt"))
      << "Wir haben das ganze Wochenende den Dachboden aufgeräumt und alte Briefe gefunden.";
  std::ofstream(dir.file("digits.txt")) << "1234 5678 90";
  std::ofstream(dir.file("empty.txt"));
  std::ofstream(dir.file("bad.txt")) << "\xff\xfe\x80 \xc3";
  runCases({
      {"lang '" + dir.file("de.txt") + "'", 0, "de\n"},
      {"lang < '" + dir.file("de.txt") + "'", 0, "de\n"},
      {"lang - < '" + dir.file("de.txt") + "'", 0, "de\n"},
      {"lang '" + dir.file("digits.txt") + "'", 1, ""},
      {"lang '" + dir.file("empty.txt") + "'", 1, ""},
      {"lang '" + dir.file("bad.txt") + "'", 1, ""},
      {"lang '" + dir.file("missing.txt") + "'", 2, ""},
      {"lang '" + dir.path() + "'", 2, ""},
      {"lang a b", 2, ""},
      {"lang --fast", 2, ""},
  });
}

TEST(StringCommands, HeaderPrintsTheValueOrTheAddress) {
  testing::TempDir dir;
  std::ofstream(dir.file("m.eml")) << "From: Ada Lovelace <ada@example.com>\r\n"
                                      "Subject: Grüße\r\n\r\nBody\r\n";
  std::string message = "'" + dir.file("m.eml") + "'";
  runCases({
      {"header subject " + message, 0, "Grüße\n"},
      {"header From " + message, 0, "Ada Lovelace <ada@example.com>\n"},
      {"header From --address " + message, 0, "ada@example.com\n"},
      {"header --address From " + message, 0, "ada@example.com\n"},
      {"header From --address < " + message, 0, "ada@example.com\n"},
      {"header Subject --address " + message, 1, ""},
      {"header To " + message, 1, ""},
      {"header 'Subject(' " + message, 1, ""},
      {"header", 2, ""},
      {"header From " + message + " extra", 2, ""},
      {"header From --verbose " + message, 2, ""},
      {"header From '" + dir.file("missing.eml") + "'", 2, ""},
  });
}

}  // namespace
}  // namespace corvel
