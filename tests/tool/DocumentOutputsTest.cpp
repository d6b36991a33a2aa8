// `corvel ocr` on documents, each output checked by the program a user would open it
// with: qpdf --check and pdftotext -bbox (poppler-utils) for the searchable PDF, xmllint
// for hOCR and ALTO, the TSV's columns, a JSON parser.
#include <gtest/gtest.h>

#include <map>
#include <nlohmann/json.hpp>
#include <regex>
#include <sstream>

#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Image.h"
#include "support/TestSupport.h"
#include "support/TextDistance.h"

namespace corvel {
namespace {

std::string document(const std::string& name) { return testing::fixturePath("documents/" + name); }
std::string run(const std::string& command) { return testing::runCommand(command).output; }

using testing::characterErrorRate;

struct TsvWord {
  int page;
  double left, top, width, height;
  std::string text;
};

// The word rows (level 5) of a TSV; every row must have the engine's twelve columns.
std::vector<TsvWord> tsvWords(const std::string& tsv) {
  std::istringstream lines(tsv);
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(line,
            "level\tpage_num\tblock_num\tpar_num\tline_num\tword_num\tleft\ttop\twidth\theight\t"
            "conf\ttext");
  std::vector<TsvWord> words;
  while (std::getline(lines, line)) {
    std::vector<std::string> fields;
    std::istringstream row(line);
    for (std::string field; std::getline(row, field, '\t');) fields.push_back(field);
    if (line.back() == '\t') fields.push_back("");
    EXPECT_EQ(fields.size(), 12u) << line;
    if (fields.size() != 12 || fields[0] != "5") continue;
    EXPECT_GE(std::stod(fields[10]), 0) << line;
    words.push_back({std::stoi(fields[1]), std::stod(fields[6]), std::stod(fields[7]),
                     std::stod(fields[8]), std::stod(fields[9]), fields[11]});
  }
  return words;
}

int xpathCount(const std::string& file, const std::string& expression) {
  auto result = testing::runCommand("xmllint --xpath \"count(" + expression + ")\" " + file);
  return result.status == 0 ? std::stoi(result.output) : -1;
}

// The searchable PDF of a document with a typed page (and an outline and a title) and a
// scanned page: the typed page, the picture, the outline and the title come through
// untouched, and every word read on the scan is found by pdftotext where the TSV put it.
TEST(DocumentOutputs, TheSearchablePdfIsTheOriginalPlusTextAtItsPlaces) {
  testing::TempDir dir;
  std::string out = dir.file("out.pdf");
  auto made = testing::corvel("ocr --lang en " + document("mixed.pdf") + " -o " + out + " 2>" +
                              dir.file("errors"));
  EXPECT_EQ(made.status, 0);
  EXPECT_NE(testing::fileText(dir.file("errors")).find("page 1 has text already"),
            std::string::npos);
  EXPECT_EQ(testing::runCommand("qpdf --check " + out).status, 0);
  EXPECT_NE(run("pdfinfo " + out).find("Mixed fixture"), std::string::npos);
  EXPECT_NE(run("qpdf --json --json-key=outlines " + out).find("Typed page"), std::string::npos);
  EXPECT_EQ(run("pdftotext -f 1 -l 1 " + out + " - | tr -s ' \\n\\f' ' '"),
            "Typed words stay as they are ");
  run("cd " + dir.path() + " && pdfimages -j " + document("mixed.pdf") +
      " before && pdfimages -j " + out + " after");
  std::string picture = testing::fileText(dir.file("before-000.jpg"));
  EXPECT_TRUE(!picture.empty() && picture == testing::fileText(dir.file("after-000.jpg")));

  auto words =
      tsvWords(testing::corvel("ocr --lang en " + document("mixed.pdf") + " --format tsv").output);
  ASSERT_GT(words.size(), 50u);
  // pdftotext's words on the scanned page, by text: their left edge and vertical middle.
  std::multimap<std::string, std::pair<double, double>> found;
  std::regex word(
      R"re(xMin="([0-9.]+)" yMin="([0-9.]+)" xMax="[0-9.]+" yMax="([0-9.]+)">([^<]*)<)re");
  std::string bbox = run("pdftotext -f 2 -l 2 -bbox " + out + " -");
  for (std::sregex_iterator it(bbox.begin(), bbox.end(), word), end; it != end; ++it) {
    found.emplace((*it)[4], std::make_pair(std::stod((*it)[1]),
                                           (std::stod((*it)[2]) + std::stod((*it)[3])) / 2));
  }
  std::size_t placed = 0, escaped = 0;
  for (const auto& w : words) {
    if (w.text.find_first_of("&<>\"'") != std::string::npos) {
      ++escaped;  // pdftotext writes these as entities
      continue;
    }
    // The scan is 150 dpi: a pixel is 72/150 of a point.
    double left = w.left * 72 / 150, top = w.top * 72 / 150, bottom = (w.top + w.height) * 72 / 150;
    auto [first, last] = found.equal_range(w.text);
    placed += std::any_of(first, last, [&](const auto& f) {
      return std::abs(f.second.first - left) < 1.5 && f.second.second > top - 2 &&
             f.second.second < bottom + 2;
    });
  }
  EXPECT_GE(placed + escaped, words.size() * 95 / 100) << bbox;
}

// A two-page TIFF read from standard input: every page, in every format, and the
// formats agree on the words.
TEST(DocumentOutputs, EveryTiffPageInEveryFormatPassesItsReader) {
  testing::TempDir dir;
  std::string input =
      "cat " + document("pages.tif") + " | " CORVEL_TOOL_PATH " ocr --fast --lang en --lang fr - ";
  auto words = tsvWords(run(input + "--format tsv"));
  std::string text[3];
  for (const auto& w : words) text[w.page] += w.text + " ";
  EXPECT_LT(characterErrorRate(testing::fixtureText("ocr/one-column.txt"), text[1]), 0.05)
      << text[1];
  EXPECT_LT(characterErrorRate(testing::fixtureText("ocr/french.txt"), text[2]), 0.05) << text[2];

  for (std::string name : {"out.hocr", "out.xml"}) {
    ASSERT_EQ(testing::runCommand(input + "-o " + dir.file(name)).status, 0) << name;
    EXPECT_EQ(testing::runCommand("xmllint --noout " + dir.file(name)).status, 0) << name;
  }
  EXPECT_EQ(xpathCount(dir.file("out.hocr"), "//*[@class='ocr_page']"), 2);
  EXPECT_EQ(xpathCount(dir.file("out.hocr"), "//*[@class='ocrx_word']"),
            static_cast<int>(words.size()));
  // hOCR's boxes are left, top, right, bottom: its first word sits where the TSV puts it.
  auto at = [](double v) { return std::to_string(static_cast<int>(v)); };
  const TsvWord& w = words[0];
  EXPECT_EQ(
      run("xmllint --xpath \"string((//*[@class='ocrx_word'])[1]/@title)\" " + dir.file("out.hocr"))
          .rfind("bbox " + at(w.left) + " " + at(w.top) + " " + at(w.left + w.width) + " " +
                     at(w.top + w.height) + ";",
                 0),
      0u);
  EXPECT_EQ(xpathCount(dir.file("out.xml"), "//*[local-name()='Page']"), 2);
  EXPECT_EQ(xpathCount(dir.file("out.xml"), "//*[local-name()='String']"),
            static_cast<int>(words.size()));

  // JSON: one document for several inputs, the one that cannot be read as an error entry.
  auto result = testing::runCommand(input + "--json " + dir.file("missing.tif") + " 2>/dev/null");
  EXPECT_EQ(result.status, 1);
  auto json = nlohmann::json::parse(result.output, nullptr, false);
  ASSERT_FALSE(json.is_discarded()) << result.output;
  ASSERT_EQ(json["files"].size(), 2u);
  EXPECT_TRUE(json["files"][1].contains("error"));
  const auto& pages = json["files"][0]["pages"];
  ASSERT_EQ(pages.size(), 2u);
  EXPECT_EQ(pages[1]["width"], 1000);
  EXPECT_EQ(pages[1]["resolution"], 150);
  const auto& firstWord = pages[0]["blocks"][0]["paragraphs"][0]["lines"][0]["words"][0];
  EXPECT_EQ(firstWord["text"], words[0].text);
  EXPECT_EQ(firstWord["box"]["left"], words[0].left);
  EXPECT_NEAR(firstWord["box"]["normalized"]["x"].get<double>(), words[0].left / 1000, 1e-9);
  EXPECT_GT(firstWord["confidence"].get<double>(), 50);
}

TEST(OcrCommand, ABlankPageFindsNothingAndADamagedFileGetsOneLine) {
  testing::TempDir dir;
  Data white(64 * 48 * 4, 255);
  auto png = pngDataForBitmap(*Bitmap::fromRGBA(64, 48, white.data(), white.size()));
  ASSERT_TRUE(png && writeFileAtomically(dir.file("blank.png"), *png));
  EXPECT_EQ(testing::corvel("ocr " + dir.file("blank.png")).status, 1);

  auto scan = readFile(document("scan.pdf"));
  ASSERT_TRUE(writeFileAtomically(dir.file("cut.pdf"), Data(scan->begin(), scan->begin() + 400)));
  auto result = testing::corvel("ocr " + dir.file("cut.pdf") + " 2>&1 >/dev/null");
  EXPECT_NE(result.status, 0);
  EXPECT_EQ(std::count(result.output.begin(), result.output.end(), '\n'), 1) << result.output;
  EXPECT_EQ(result.output.rfind("corvel: " + dir.file("cut.pdf") + ": ", 0), 0u) << result.output;
}

}  // namespace
}  // namespace corvel
