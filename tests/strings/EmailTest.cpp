#include <gtest/gtest.h>

#include <chrono>

#include "Corvelbase/Email.h"

namespace corvel {
namespace {

using Email::headerValueForField;

const String kMessage =
    u"From: Ada Lovelace <ada@example.com>\r\n"
    u"To: charles.babbage@example.com, ada@example.com\r\n"
    u"Cc:\tJane <jane@example.net>\r\n"
    u"Subject: Hello\r\n"
    u"X-Note:NoSpace\r\n"
    u"Thread-Topic: first line\r\n"
    u"  folded second line\r\n"
    u"Date:  Mon, 2 Jan 2023 10:00:00 +0000\r\n"
    u"\r\n"
    u"Body text. Subject: not a header because it does not start a line\n";

TEST(HeaderValue, ReadsTheFirstMatchingLineAndItsAddress) {
  const std::tuple<const char16_t*, bool, std::optional<std::u16string>> cases[] = {
      // Field names match in any case; the value is the rest of the line.
      {u"subject", false, u"Hello"},
      {u"Cc", false, u"Jane <jane@example.net>"},  // a tab is white space too
      // Exactly one white-space character is eaten: a second one is part of the value.
      {u"Date", false, u" Mon, 2 Jan 2023 10:00:00 +0000"},
      // No white space after the colon: no value.
      {u"X-Note", false, std::nullopt},
      // Folded lines are not joined.
      {u"Thread-Topic", false, u"first line"},
      // The name must start a line and be followed by the colon.
      {u"Topic", false, std::nullopt},
      {u"Sub", false, std::nullopt},
      // The field is a pattern: its metacharacters keep their meaning; the first line wins.
      {u"(?:To|Cc)", false, u"charles.babbage@example.com, ada@example.com"},
      // Patterns that do not compile, or bring groups of their own: no value, no crash.
      {u"Subject(", false, std::nullopt},
      {u"(Subject)", false, std::nullopt},
      // Address extraction takes what the address pattern finds in the value.
      {u"From", true, u"ada@example.com"},
      // The first address of a list: a dotted local part keeps only what follows its last
      // dot, and the trailing comma stays.
      {u"To", true, u"babbage@example.com,"},
      {u"Subject", true, std::nullopt},  // a value without an address
  };
  for (const auto& [field, extract, expected] : cases)
    EXPECT_EQ(headerValueForField(kMessage, field, extract), expected) << toUTF8(field);
  // An empty value is returned as it is, extraction or not.
  EXPECT_EQ(headerValueForField(u"Subject: \nBody", u"Subject", true), u"");
}

TEST(HeaderValue, OddMessagesGetDefinedAnswers) {
  // Unpaired surrogates pass through untouched.
  EXPECT_EQ(headerValueForField(u"Subject: a\xD800z\n", u"subject"), String(u"a\xD800z"));
  // The white space after the colon may be the line end itself; the value is then the
  // next line, as the pattern reads it.
  EXPECT_EQ(headerValueForField(u"Subject:\nNext line", u"Subject"), u"Next line");
  // A field whose matching runs away is stopped and answers nothing.
  String runaway(5000, u'a');
  auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(headerValueForField(runaway + u"\n", u"(?:a|aa)+(?:a|aa)+b"), std::nullopt);
  EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(30));
  // A field as long as a header line can be is still a name; one unit longer is refused
  // before a pattern is made of it.
  String name(Email::kMaxHeaderFieldLength, u'X');
  EXPECT_EQ(headerValueForField(name + u": v\n", name), u"v");
  EXPECT_EQ(headerValueForField(name + u"X: v\n", name + u"X"), std::nullopt);
}

}  // namespace
}  // namespace corvel
