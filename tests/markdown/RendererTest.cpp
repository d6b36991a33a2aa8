// What the commands write must mean the intended thing to a real renderer: each test edits
// a small document and renders it with cmark-gfm and its table and task-list extensions.
#include <gtest/gtest.h>

#include <regex>

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Files.h"
#include "ReferenceLineModel.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

namespace md = MarkdownCommands;

std::string render(const String& markdown) {
  testing::TempDir dir;
  std::string path = dir.file("doc.md");
  std::string bytes = toUTF8(markdown);
  EXPECT_TRUE(
      writeFileAtomically(path, reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size()));
  testing::CommandResult result =
      testing::runCommand("cmark-gfm -e table -e tasklist '" + path + "'");
  EXPECT_EQ(result.status, 0) << "cmark-gfm failed";
  return result.output;
}

std::size_t count(const std::string& html, const std::string& pattern) {
  std::regex re(pattern);
  return static_cast<std::size_t>(
      std::distance(std::sregex_iterator(html.begin(), html.end(), re), std::sregex_iterator()));
}

template <typename Command>
String edited(const String& text, Range selection, Command command) {
  Range replaced;
  String out = command(text, selection, &replaced);
  return testing::applyEdit(text, replaced, out);
}

TEST(Rendered, TableHasTheAskedColumnsAndRows) {
  const String doc = u"Intro\n\nMore text\n";
  for (std::uint64_t columns : {1, 3, 5}) {
    String text = edited(doc, {0, 0}, [&](const String& t, Range r, Range* out) {
      return md::insertTable(t, r, 3, columns, out);
    });
    std::string html = render(text);
    ASSERT_EQ(count(html, "<table>"), 1u) << html;
    EXPECT_EQ(count(html, "<th[ >]"), columns) << html;
    EXPECT_EQ(count(html, "<td[ >]"), 2 * columns) << html;  // rows 3 = header + 2 body rows
    EXPECT_NE(html.find("<p>Intro</p>"), std::string::npos) << html;
  }
}

TEST(Rendered, TaskListHasCheckboxes) {
  const String doc = u"buy milk\nwalk dog\n";
  std::string html = render(edited(doc, {0, doc.size()}, [](auto& t, Range r, Range* o) {
    return md::insertTaskList(t, r, o, nullptr);
  }));
  EXPECT_EQ(count(html, "<input type=\"checkbox\""), 2u) << html;
  EXPECT_EQ(count(html, "checked"), 0u) << html;
  EXPECT_NE(html.find("walk dog"), std::string::npos) << html;
}

TEST(Rendered, BulletsAndNumbersMakeLists) {
  const String doc = u"alpha\nbeta\ngamma\n";
  std::string bullets = render(edited(doc, {0, doc.size()}, [](auto& t, Range r, Range* o) {
    return md::insertUnorderedList(t, r, o, nullptr);
  }));
  EXPECT_EQ(count(bullets, "<ul>"), 1u) << bullets;
  EXPECT_EQ(count(bullets, "<li>"), 3u) << bullets;

  std::string numbers = render(edited(doc, {0, doc.size()}, [](auto& t, Range r, Range* o) {
    return md::insertNumberedList(t, r, o, nullptr);
  }));
  EXPECT_EQ(count(numbers, "<ol>"), 1u) << numbers;
  EXPECT_EQ(count(numbers, "<li>(alpha|beta|gamma)</li>"), 3u) << numbers;
  EXPECT_LT(numbers.find("alpha"), numbers.find("gamma"));
}

TEST(Rendered, QuoteAndRule) {
  const String doc = u"first\n\nquote me\nand me\n";
  std::string quoted = render(edited(
      doc, {7, 12}, [](auto& t, Range r, Range* o) { return md::insertQuote(t, r, o, nullptr); }));
  EXPECT_TRUE(std::regex_search(quoted, std::regex("<blockquote>\\s*<p>quote me\\s+and me</p>")))
      << quoted;
  EXPECT_NE(quoted.find("<p>first</p>"), std::string::npos) << quoted;

  std::string ruled = render(edited(doc, {7, 0}, md::insertHorizontalLine));
  EXPECT_EQ(count(ruled, "<hr />"), 1u) << ruled;
  EXPECT_LT(ruled.find("<hr />"), ruled.find("quote me")) << ruled;
}

TEST(Rendered, CodeBlockHoldsTheSelectedText) {
  const String whole = u"before\nlet x = 1;\nafter\n";
  auto fence = [](const String& t, Range r, Range* o) { return *md::insertCodeBlock(t, r, o); };
  std::string html = render(edited(whole, {7, 10}, fence));
  EXPECT_NE(html.find("<pre><code>let x = 1;\n</code></pre>"), std::string::npos) << html;
  EXPECT_NE(html.find("<p>after</p>"), std::string::npos) << html;

  // From the middle of a line the fence still starts a line of its own.
  std::string mid = render(edited(u"say hello world\n", {4, 5}, fence));
  EXPECT_NE(mid.find("<pre><code>hello\n</code></pre>"), std::string::npos) << mid;
}

}  // namespace
}  // namespace corvel
