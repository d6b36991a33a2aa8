// What the commands write must mean the intended thing to a real renderer: each test edits
// a small document and renders it with cmark-gfm and its table and task-list extensions.
#include <gtest/gtest.h>

#include <regex>
#include <type_traits>

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Files.h"
#include "ReferenceLineModel.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

std::string render(const String& markdown) {
  testing::TempDir dir;
  std::string path = dir.file("doc.md");
  std::string bytes = toUTF8(markdown);
  EXPECT_TRUE(writeFileAtomically(path, Data(bytes.begin(), bytes.end())));
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

// `text` rendered once `command` edited it, as an editor applies the answer. Commands that
// also report a selection get nullptr for it.
template <typename Command>
std::string renderEdited(const String& text, Range selection, Command command) {
  Range replaced;
  String out;
  if constexpr (std::is_invocable_v<Command, const String&, Range, Range*, Range*>)
    out = command(text, selection, &replaced, nullptr);
  else
    out = command(text, selection, &replaced);
  return render(testing::applyEdit(text, replaced, out));
}

TEST(Rendered, TableHasTheAskedColumnsAndRows) {
  for (std::uint64_t columns : {1, 3, 5}) {
    std::string html =
        renderEdited(u"Intro\n\nMore text\n", {0, 0}, [&](const String& t, Range r, Range* out) {
          return md::insertTable(t, r, 3, columns, out);
        });
    ASSERT_EQ(count(html, "<table>"), 1u) << html;
    EXPECT_EQ(count(html, "<th[ >]"), columns) << html;
    EXPECT_EQ(count(html, "<td[ >]"), 2 * columns) << html;  // rows 3 = header + 2 body rows
    EXPECT_NE(html.find("<p>Intro</p>"), std::string::npos) << html;
  }
}

TEST(Rendered, TasksAndNumbersMakeLists) {
  const String doc = u"alpha\nbeta\ngamma\n";
  const Range all{0, doc.size()};
  std::string tasks = renderEdited(doc, all, md::insertTaskList);
  EXPECT_EQ(count(tasks, "<input type=\"checkbox\""), 3u) << tasks;
  EXPECT_EQ(count(tasks, "checked"), 0u) << tasks;

  std::string numbers = renderEdited(doc, all, md::insertNumberedList);
  EXPECT_EQ(count(numbers, "<ol>"), 1u) << numbers;
  EXPECT_EQ(count(numbers, "<li>(alpha|beta|gamma)</li>"), 3u) << numbers;
}

TEST(Rendered, QuoteRuleAndCodeBlock) {
  const String doc = u"first\n\nquote me\nand me\n";
  std::string quoted = renderEdited(doc, {7, 12}, md::insertQuote);
  EXPECT_TRUE(std::regex_search(quoted, std::regex("<blockquote>\\s*<p>quote me\\s+and me</p>")))
      << quoted;
  EXPECT_NE(quoted.find("<p>first</p>"), std::string::npos) << quoted;

  std::string ruled = renderEdited(doc, {7, 0}, md::insertHorizontalLine);
  EXPECT_EQ(count(ruled, "<hr />"), 1u) << ruled;
  EXPECT_LT(ruled.find("<hr />"), ruled.find("quote me")) << ruled;

  auto fence = [](const String& t, Range r, Range* o) { return *md::insertCodeBlock(t, r, o); };
  std::string html = renderEdited(u"before\nlet x = 1;\nafter\n", {7, 10}, fence);
  EXPECT_NE(html.find("<pre><code>let x = 1;\n</code></pre>"), std::string::npos) << html;
  EXPECT_NE(html.find("<p>after</p>"), std::string::npos) << html;
  // From the middle of a line the fence still starts a line of its own.
  std::string mid = renderEdited(u"say hello world\n", {4, 5}, fence);
  EXPECT_NE(mid.find("<pre><code>hello\n</code></pre>"), std::string::npos) << mid;
}

}  // namespace
}  // namespace corvel
