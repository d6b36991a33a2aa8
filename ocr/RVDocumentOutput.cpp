// The output formats of recognition results.
#include "Corvelbase/RVDocumentOutput.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <nlohmann/json.hpp>

#include "Corvelbase/platform/Files.h"

namespace corvel {

namespace {

using nlohmann::json;

// --- the page's structure ----------------------------------------------------------------

struct PixelBox {
  long left = 0, top = 0, right = 0, bottom = 0;
  long width() const { return right - left; }
  long height() const { return bottom - top; }
};

PixelBox toPixels(const Rect& box, Size size) {
  auto clampTo = [](double v, double limit) {
    return static_cast<long>(std::lround(std::clamp(std::isfinite(v) ? v : 0.0, 0.0, limit)));
  };
  return {clampTo(box.origin.x * size.width, size.width),
          clampTo((1 - box.origin.y - box.size.height) * size.height, size.height),
          clampTo((box.origin.x + box.size.width) * size.width, size.width),
          clampTo((1 - box.origin.y) * size.height, size.height)};
}

// The words of a line; a recogniser that does not tell words apart gives the line as
// one word.
std::vector<RecognizedWord> wordsOf(const RecognizedTextObservation& line) {
  if (!line.words.empty() || line.candidates.empty()) return line.words;
  return {{line.candidates[0].string, line.boundingBox, line.candidates[0].confidence}};
}

String lineText(const RecognizedTextObservation& line) {
  return line.candidates.empty() ? String() : line.candidates[0].string;
}

struct Paragraph {
  std::vector<const RecognizedTextObservation*> lines;
  Rect box;
};
struct Block {
  std::vector<Paragraph> paragraphs;
  Rect box;
};

// The engine's blocks and paragraphs: runs of lines with the same numbers.
std::vector<Block> structure(const std::vector<RecognizedTextObservation>& lines) {
  std::vector<Block> blocks;
  const RecognizedTextObservation* previous = nullptr;
  for (const auto& line : lines) {
    if (line.candidates.empty()) continue;
    if (!previous || line.block != previous->block) {
      blocks.push_back({{}, line.boundingBox});
      blocks.back().paragraphs.push_back({{}, line.boundingBox});
    } else if (line.paragraph != previous->paragraph) {
      blocks.back().paragraphs.push_back({{}, line.boundingBox});
    }
    Block& block = blocks.back();
    block.box = rectUnion(block.box, line.boundingBox);
    block.paragraphs.back().box = rectUnion(block.paragraphs.back().box, line.boundingBox);
    block.paragraphs.back().lines.push_back(&line);
    previous = &line;
  }
  return blocks;
}

std::string xmlEscaped(const std::string& text) {
  std::string out;
  for (char c : text) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      case '\'':
        out += "&#39;";
        break;
      default:
        // Control characters other than tab and line feed are not allowed in XML 1.0.
        if (static_cast<unsigned char>(c) >= 0x20 || c == '\t' || c == '\n') out += c;
    }
  }
  return out;
}

std::string bbox(const PixelBox& b) {
  return "bbox " + std::to_string(b.left) + " " + std::to_string(b.top) + " " +
         std::to_string(b.right) + " " + std::to_string(b.bottom);
}

std::string fixed(double value, int decimals) {
  char text[48];
  std::snprintf(text, sizeof text, "%.*f", decimals, value);
  return text;
}

int percent(float confidence) { return static_cast<int>(std::lround(confidence * 100.0)); }

// --- text --------------------------------------------------------------------------------

class TextWriter final : public RVDocumentWriter {
 public:
  TextWriter(std::ostream& out, std::size_t inputs) : out_(out), headers_(inputs > 1) {}
  void add(const RVDocumentResult& result) override {
    // An input that could not be read has no text, and no header either.
    if (result.error && result.pages.empty()) return;
    if (headers_) out_ << (first_ ? "" : "\n") << "==> " << result.name << " <==\n";
    first_ = false;
    bool firstPage = true;
    for (const auto& page : result.pages) {
      if (!firstPage) out_ << '\f';
      firstPage = false;
      if (!page.error) out_ << toUTF8(page.text) << '\n';
    }
    out_.flush();
  }
  void end() override { out_.flush(); }

 private:
  std::ostream& out_;
  bool headers_;
  bool first_ = true;
};

// --- JSON --------------------------------------------------------------------------------

json errorJson(const Error& error) {
  return {{"domain", error.domain},
          {"code", error.code},
          {"reason", error.userInfoString("Error reason")}};
}

json boxJson(const Rect& box, Size size) {
  PixelBox p = toPixels(box, size);
  return {{"left", p.left},
          {"top", p.top},
          {"width", p.width()},
          {"height", p.height()},
          {"normalized",
           {{"x", box.origin.x},
            {"y", box.origin.y},
            {"width", box.size.width},
            {"height", box.size.height}}}};
}

json pageJson(const RVDocumentPage& page) {
  json out = {{"page", page.index + 1},
              {"width", page.pixelSize.width},
              {"height", page.pixelSize.height},
              {"resolution", page.resolution},
              {"source", page.hasOwnText ? "pdf-text" : "ocr"},
              {"text", toUTF8(page.text)},
              {"blocks", json::array()}};
  if (page.error) out["error"] = errorJson(*page.error);
  for (const auto& block : structure(page.observations)) {
    json paragraphs = json::array();
    for (const auto& paragraph : block.paragraphs) {
      json lines = json::array();
      for (const auto* line : paragraph.lines) {
        json words = json::array();
        for (const auto& word : wordsOf(*line)) {
          words.push_back({{"text", toUTF8(word.string)},
                           {"confidence", word.confidence * 100.0},
                           {"box", boxJson(word.boundingBox, page.pixelSize)}});
        }
        lines.push_back({{"text", toUTF8(lineText(*line))},
                         {"confidence", line->candidates[0].confidence * 100.0},
                         {"box", boxJson(line->boundingBox, page.pixelSize)},
                         {"words", words}});
      }
      paragraphs.push_back({{"box", boxJson(paragraph.box, page.pixelSize)}, {"lines", lines}});
    }
    out["blocks"].push_back(
        {{"box", boxJson(block.box, page.pixelSize)}, {"paragraphs", paragraphs}});
  }
  return out;
}

class JsonWriter final : public RVDocumentWriter {
 public:
  explicit JsonWriter(std::ostream& out) : out_(out) { out_ << "{\"files\":["; }
  void add(const RVDocumentResult& result) override {
    json file = {{"file", result.name}, {"pages", json::array()}};
    if (result.error) file["error"] = errorJson(*result.error);
    for (const auto& page : result.pages) file["pages"].push_back(pageJson(page));
    out_ << (first_ ? "\n" : ",\n") << file.dump(-1, ' ', false, json::error_handler_t::replace);
    first_ = false;
    out_.flush();
  }
  void end() override { out_ << "\n]}\n" << std::flush; }

 private:
  std::ostream& out_;
  bool first_ = true;
};

// --- hOCR --------------------------------------------------------------------------------

class HocrWriter final : public RVDocumentWriter {
 public:
  explicit HocrWriter(std::ostream& out) : out_(out) {
    out_ << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
            "<!DOCTYPE html PUBLIC \"-//W3C//DTD XHTML 1.0 Transitional//EN\"\n"
            "    \"http://www.w3.org/TR/xhtml1/DTD/xhtml1-transitional.dtd\">\n"
            "<html xmlns=\"http://www.w3.org/1999/xhtml\" xml:lang=\"en\" lang=\"en\">\n"
            " <head>\n  <title></title>\n"
            "  <meta http-equiv=\"Content-Type\" content=\"text/html;charset=utf-8\"/>\n"
            "  <meta name='ocr-system' content='corvel' />\n"
            "  <meta name='ocr-capabilities' content='ocr_page ocr_carea ocr_par ocr_line "
            "ocrx_word ocrp_wconf'/>\n"
            " </head>\n <body>\n";
  }
  void add(const RVDocumentResult& result) override {
    for (const auto& page : result.pages) addPage(result.name, page);
    out_.flush();
  }
  void end() override { out_ << " </body>\n</html>\n" << std::flush; }

 private:
  void addPage(const std::string& name, const RVDocumentPage& page) {
    std::size_t n = ++pages_;
    std::string id = std::to_string(n);
    auto res = std::to_string(std::lround(page.resolution));
    out_ << "  <div class='ocr_page' id='page_" << id << "' title='image \"" << xmlEscaped(name)
         << "\"; " << bbox(toPixels(Rect(0, 0, 1, 1), page.pixelSize)) << "; ppageno " << n - 1
         << (page.resolution > 0 ? "; scan_res " + res + " " + res : "") << "'>\n";
    std::size_t blocks = 0, paragraphs = 0, lines = 0, words = 0;
    for (const auto& block : structure(page.observations)) {
      out_ << "   <div class='ocr_carea' id='block_" << id << "_" << ++blocks << "' title=\""
           << bbox(toPixels(block.box, page.pixelSize)) << "\">\n";
      for (const auto& paragraph : block.paragraphs) {
        out_ << "    <p class='ocr_par' id='par_" << id << "_" << ++paragraphs << "' title=\""
             << bbox(toPixels(paragraph.box, page.pixelSize)) << "\">\n";
        for (const auto* line : paragraph.lines) {
          PixelBox box = toPixels(line->boundingBox, page.pixelSize);
          out_ << "     <span class='ocr_line' id='line_" << id << "_" << ++lines << "' title=\""
               << bbox(box) << "; x_size " << box.height() << "\">\n";
          for (const auto& word : wordsOf(*line)) {
            out_ << "      <span class='ocrx_word' id='word_" << id << "_" << ++words << "' title='"
                 << bbox(toPixels(word.boundingBox, page.pixelSize)) << "; x_wconf "
                 << percent(word.confidence) << "'>" << xmlEscaped(toUTF8(word.string))
                 << "</span>\n";
          }
          out_ << "     </span>\n";
        }
        out_ << "    </p>\n";
      }
      out_ << "   </div>\n";
    }
    out_ << "  </div>\n";
  }

  std::ostream& out_;
  std::size_t pages_ = 0;
};

// --- ALTO --------------------------------------------------------------------------------

std::string altoBox(const PixelBox& b) {
  return "HPOS=\"" + std::to_string(b.left) + "\" VPOS=\"" + std::to_string(b.top) + "\" WIDTH=\"" +
         std::to_string(b.width()) + "\" HEIGHT=\"" + std::to_string(b.height()) + "\"";
}

class AltoWriter final : public RVDocumentWriter {
 public:
  explicit AltoWriter(std::ostream& out) : out_(out) {}
  void add(const RVDocumentResult& result) override {
    if (!started_) begin(result.name);
    for (const auto& page : result.pages) addPage(page);
    out_.flush();
  }
  void end() override {
    if (!started_) begin("");
    out_ << "\t</Layout>\n</alto>\n" << std::flush;
  }

 private:
  void begin(const std::string& name) {
    started_ = true;
    out_ << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
            "<alto xmlns=\"http://www.loc.gov/standards/alto/ns-v3#\" "
            "xmlns:xlink=\"http://www.w3.org/1999/xlink\" "
            "xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
            "xsi:schemaLocation=\"http://www.loc.gov/standards/alto/ns-v3# "
            "http://www.loc.gov/alto/v3/alto-3-0.xsd\">\n"
            "\t<Description>\n\t\t<MeasurementUnit>pixel</MeasurementUnit>\n"
            "\t\t<sourceImageInformation>\n\t\t\t<fileName>"
         << xmlEscaped(name)
         << "</fileName>\n\t\t</sourceImageInformation>\n"
            "\t\t<OCRProcessing ID=\"OCR_0\">\n\t\t\t<ocrProcessingStep>\n"
            "\t\t\t\t<processingSoftware>\n\t\t\t\t\t<softwareName>corvel</softwareName>\n"
            "\t\t\t\t</processingSoftware>\n\t\t\t</ocrProcessingStep>\n"
            "\t\t</OCRProcessing>\n\t</Description>\n\t<Layout>\n";
  }

  void addPage(const RVDocumentPage& page) {
    auto width = std::to_string(std::lround(page.pixelSize.width));
    auto height = std::to_string(std::lround(page.pixelSize.height));
    out_ << "\t\t<Page WIDTH=\"" << width << "\" HEIGHT=\"" << height << "\" PHYSICAL_IMG_NR=\""
         << pages_ << "\" ID=\"page_" << pages_ << "\">\n"
         << "\t\t\t<PrintSpace HPOS=\"0\" VPOS=\"0\" WIDTH=\"" << width << "\" HEIGHT=\"" << height
         << "\">\n";
    ++pages_;
    for (const auto& block : structure(page.observations)) {
      out_ << "\t\t\t\t<ComposedBlock ID=\"cblock_" << blocks_++ << "\" "
           << altoBox(toPixels(block.box, page.pixelSize)) << ">\n";
      for (const auto& paragraph : block.paragraphs) {
        out_ << "\t\t\t\t\t<TextBlock ID=\"block_" << paragraphs_++ << "\" "
             << altoBox(toPixels(paragraph.box, page.pixelSize)) << ">\n";
        for (const auto* line : paragraph.lines) {
          out_ << "\t\t\t\t\t\t<TextLine ID=\"line_" << lines_++ << "\" "
               << altoBox(toPixels(line->boundingBox, page.pixelSize)) << ">\n\t\t\t\t\t\t\t";
          auto words = wordsOf(*line);
          for (std::size_t i = 0; i < words.size(); ++i) {
            PixelBox box = toPixels(words[i].boundingBox, page.pixelSize);
            out_ << "<String ID=\"string_" << strings_++ << "\" " << altoBox(box) << " WC=\""
                 << fixed(words[i].confidence, 2) << "\" CONTENT=\""
                 << xmlEscaped(toUTF8(words[i].string)) << "\"/>";
            if (i + 1 < words.size()) {
              PixelBox next = toPixels(words[i + 1].boundingBox, page.pixelSize);
              out_ << "<SP WIDTH=\"" << std::max(0L, next.left - box.right) << "\" VPOS=\""
                   << box.top << "\" HPOS=\"" << box.right << "\"/>\n\t\t\t\t\t\t\t";
            }
          }
          out_ << "\n\t\t\t\t\t\t</TextLine>\n";
        }
        out_ << "\t\t\t\t\t</TextBlock>\n";
      }
      out_ << "\t\t\t\t</ComposedBlock>\n";
    }
    out_ << "\t\t\t</PrintSpace>\n\t\t</Page>\n";
  }

  std::ostream& out_;
  bool started_ = false;
  std::size_t pages_ = 0, blocks_ = 0, paragraphs_ = 0, lines_ = 0, strings_ = 0;
};

// --- TSV ---------------------------------------------------------------------------------

class TsvWriter final : public RVDocumentWriter {
 public:
  explicit TsvWriter(std::ostream& out) : out_(out) {
    out_ << "level\tpage_num\tblock_num\tpar_num\tline_num\tword_num\tleft\ttop\twidth\theight\t"
            "conf\ttext\n";
  }
  void add(const RVDocumentResult& result) override {
    for (const auto& page : result.pages) addPage(page);
    out_.flush();
  }
  void end() override { out_.flush(); }

 private:
  void row(int level, std::size_t block, std::size_t paragraph, std::size_t line, std::size_t word,
           const PixelBox& box, const std::string& confidence, const std::string& text) {
    out_ << level << '\t' << pages_ << '\t' << block << '\t' << paragraph << '\t' << line << '\t'
         << word << '\t' << box.left << '\t' << box.top << '\t' << box.width() << '\t'
         << box.height() << '\t' << confidence << '\t' << text << '\n';
  }

  void addPage(const RVDocumentPage& page) {
    ++pages_;
    Size size = page.pixelSize;
    row(1, 0, 0, 0, 0, toPixels(Rect(0, 0, 1, 1), size), "-1", "");
    std::size_t b = 0;
    for (const auto& block : structure(page.observations)) {
      row(2, ++b, 0, 0, 0, toPixels(block.box, size), "-1", "");
      std::size_t p = 0;
      for (const auto& paragraph : block.paragraphs) {
        row(3, b, ++p, 0, 0, toPixels(paragraph.box, size), "-1", "");
        std::size_t l = 0;
        for (const auto* line : paragraph.lines) {
          row(4, b, p, ++l, 0, toPixels(line->boundingBox, size), "-1", "");
          std::size_t w = 0;
          for (const auto& word : wordsOf(*line)) {
            // A tab or line feed inside a word would break the table's columns.
            std::string text = toUTF8(word.string);
            std::replace_if(
                text.begin(), text.end(),
                [](char c) { return c == '\t' || c == '\n' || c == '\r'; }, ' ');
            row(5, b, p, l, ++w, toPixels(word.boundingBox, size),
                fixed(word.confidence * 100.0, 6), text);
          }
        }
      }
    }
  }

  std::ostream& out_;
  std::size_t pages_ = 0;
};

}  // namespace

std::optional<RVDocumentFormat> documentFormatNamed(const std::string& name) {
  static const std::pair<const char*, RVDocumentFormat> kNames[] = {
      {"txt", RVDocumentFormat::Text},  {"json", RVDocumentFormat::JSON},
      {"hocr", RVDocumentFormat::HOCR}, {"alto", RVDocumentFormat::ALTO},
      {"tsv", RVDocumentFormat::TSV},   {"pdf", RVDocumentFormat::PDF}};
  for (const auto& [known, format] : kNames)
    if (name == known) return format;
  return std::nullopt;
}

std::string documentFormatNames() { return "txt, json, hocr, alto, tsv, pdf"; }

std::optional<RVDocumentFormat> documentFormatForPath(const std::string& path) {
  std::string extension = pathExtension(path);
  if (extension.empty()) return std::nullopt;
  std::transform(extension.begin(), extension.end(), extension.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  if (extension == "text") return RVDocumentFormat::Text;
  if (extension == "html") return RVDocumentFormat::HOCR;
  if (extension == "xml") return RVDocumentFormat::ALTO;
  return documentFormatNamed(extension);
}

RVDocumentWriter::~RVDocumentWriter() = default;

std::unique_ptr<RVDocumentWriter> RVDocumentWriter::init(RVDocumentFormat format, std::ostream& out,
                                                         std::size_t inputCount) {
  switch (format) {
    case RVDocumentFormat::Text:
      return std::make_unique<TextWriter>(out, inputCount);
    case RVDocumentFormat::JSON:
      return std::make_unique<JsonWriter>(out);
    case RVDocumentFormat::HOCR:
      return std::make_unique<HocrWriter>(out);
    case RVDocumentFormat::ALTO:
      return std::make_unique<AltoWriter>(out);
    case RVDocumentFormat::TSV:
      return std::make_unique<TsvWriter>(out);
    case RVDocumentFormat::PDF:
      return nullptr;
  }
  return nullptr;
}

bool writeSearchablePdf(const Document& document, const RVDocumentResult& result,
                        const std::string& path, Error* error) {
  std::vector<TextLayerPage> pages;
  for (const auto& page : result.pages) {
    TextLayerPage layer;
    layer.page = page.index;
    layer.recognised = !page.hasOwnText && !page.error;
    for (const auto& line : page.observations) {
      TextLayerLine out{line.boundingBox, {}};
      for (const auto& word : wordsOf(line)) out.words.push_back({word.string, word.boundingBox});
      layer.lines.push_back(std::move(out));
    }
    pages.push_back(std::move(layer));
  }
  return writeSearchablePdf(document, pages, path, error);
}

}  // namespace corvel
