// The searchable PDF: invisible text over each page, grafted onto a PDF's own pages with
// qpdf (which rewrites the file without changing what it does not touch), or laid over
// the pictures of an image or TIFF on pages made for them.
//
// The text is drawn in render mode 3 (neither filled nor stroked) with a font whose
// every character code is its own Unicode value (Identity-H, with a ToUnicode map), so
// any code point of the basic plane can be selected and searched. Each word gets its own
// text matrix: its font size is the box's height and it is stretched (Tz) to the box's
// width, so that selecting a word in a viewer highlights the word on the picture.
#include <poppler/cpp/poppler-document.h>
#include <qpdf/Buffer.hh>
#include <qpdf/Pipeline.hh>
#include <qpdf/QPDF.hh>
#include <qpdf/QPDFObjectHandle.hh>
#include <qpdf/QPDFPageDocumentHelper.hh>
#include <qpdf/QPDFPageObjectHelper.hh>
#include <qpdf/QPDFWriter.hh>

#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <map>

#include "Corvelbase/platform/Files.h"
#include "platform/DocumentBackends.h"
#include "platform/SiblingFiles.h"
#include "platform/image/BitmapNative.h"
#include "platform/pdf/PdfPages.h"

namespace corvel::detail {

PageFrame pageFrame(QPDFPageObjectHelper& page) {
  PageFrame frame;
  auto numbers = [](QPDFObjectHandle box, double out[4]) {
    if (!box.isArray() || box.getArrayNItems() != 4) return false;
    for (int i = 0; i < 4; ++i) {
      auto item = box.getArrayItem(i);
      if (!item.isNumber()) return false;
      out[i] = item.getNumericValue();
      if (!std::isfinite(out[i])) return false;
    }
    return true;
  };
  double media[4], crop[4];
  if (!numbers(page.getMediaBox(), media)) return frame;
  if (!numbers(page.getCropBox(), crop)) std::copy(media, media + 4, crop);
  // Corners may come in any order; the visible part is the crop box inside the media box.
  double left = std::max(std::min(media[0], media[2]), std::min(crop[0], crop[2]));
  double right = std::min(std::max(media[0], media[2]), std::max(crop[0], crop[2]));
  double bottom = std::max(std::min(media[1], media[3]), std::min(crop[1], crop[3]));
  double top = std::min(std::max(media[1], media[3]), std::max(crop[1], crop[3]));
  if (right - left >= 1 && top - bottom >= 1) {
    frame = PageFrame{left, bottom, right - left, top - bottom, 0};
  }
  auto rotate = page.getAttribute("/Rotate", false);
  if (rotate.isInteger())
    frame.rotate = static_cast<int>(((rotate.getIntValue() % 360) + 360) % 360);
  if (frame.rotate % 90 != 0) frame.rotate = 0;
  return frame;
}

namespace {

constexpr const char* kFontDataPaths[] = {
    "/usr/share/tesseract-ocr/5/tessdata/pdf.ttf",
    "/usr/share/tesseract-ocr/4.00/tessdata/pdf.ttf",
};
// Every glyph is this wide (thousandths of the font size), and the font's ascent and
// descent put the box a reader computes for a word where the word is on the picture.
constexpr int kGlyphWidth = 500;
constexpr int kAscent = 800, kDescent = -200;

std::string number(double value) {
  char text[32];
  std::snprintf(text, sizeof text, "%.2f", std::abs(value) < 0.005 ? 0.0 : value);
  return text;
}

QPDFObjectHandle name(const std::string& text) { return QPDFObjectHandle::newName(text); }

// The ToUnicode map: every two-byte code is the Unicode code unit of the same value
// (surrogates excepted), in ranges that keep to one first byte each as CMaps require.
std::string identityToUnicode() {
  std::string out =
      "/CIDInit /ProcSet findresource begin\n12 dict begin\nbegincmap\n"
      "/CIDSystemInfo << /Registry (Adobe) /Ordering (UCS) /Supplement 0 >> def\n"
      "/CMapName /Adobe-Identity-UCS def\n/CMapType 2 def\n"
      "1 begincodespacerange\n<0000> <FFFF>\nendcodespacerange\n";
  std::vector<int> highs;
  for (int high = 0; high < 256; ++high)
    if (high < 0xD8 || high > 0xDF) highs.push_back(high);
  for (std::size_t i = 0; i < highs.size(); i += 100) {
    std::size_t n = std::min<std::size_t>(100, highs.size() - i);
    out += std::to_string(n) + " beginbfrange\n";
    for (std::size_t j = i; j < i + n; ++j) {
      char line[32];
      std::snprintf(line, sizeof line, "<%02X00> <%02XFF> <%02X00>\n", highs[j], highs[j],
                    highs[j]);
      out += line;
    }
    out += "endbfrange\n";
  }
  return out + "endcmap\nCMapName currentdict /CMap defineresource pop\nend\nend\n";
}

// The layer's font, one object shared by every page.
QPDFObjectHandle makeFont(QPDF& pdf) {
  // Integers: readers take a real /DW as missing, and glyphs as 1000 wide.
  auto integer = [](int value) { return std::to_string(value); };
  auto descriptor = QPDFObjectHandle::parse(
      "<< /Type /FontDescriptor /FontName /CorvelTextLayer /Flags 5 /FontBBox [0 " +
      integer(kDescent) + " " + integer(kGlyphWidth) + " " + integer(kAscent) +
      "] /ItalicAngle 0 /Ascent " + integer(kAscent) + " /Descent " + integer(kDescent) +
      " /CapHeight " + integer(kAscent) + " /StemV 80 >>");
  auto cidFont = QPDFObjectHandle::parse(
      "<< /Type /Font /Subtype /CIDFontType2 /BaseFont /CorvelTextLayer"
      " /CIDSystemInfo << /Registry (Adobe) /Ordering (Identity) /Supplement 0 >> /DW " +
      integer(kGlyphWidth) + " >>");
  // Tesseract's one-glyph font, where it is installed, is embedded so that strict
  // viewers find a font; every code then maps to its glyph 1. Without it the text is
  // still selectable and searchable, since it is never drawn.
  std::optional<Data> fontFile;
  for (const char* path : kFontDataPaths)
    if ((fontFile = readFile(path))) break;
  if (fontFile && !fontFile->empty()) {
    auto file = QPDFObjectHandle::newStream(
        &pdf, std::string(reinterpret_cast<const char*>(fontFile->data()), fontFile->size()));
    file.getDict().replaceKey(
        "/Length1", QPDFObjectHandle::newInteger(static_cast<long long>(fontFile->size())));
    descriptor.replaceKey("/FontFile2", file);
    std::string map(131072, '\0');
    for (std::size_t i = 1; i < map.size(); i += 2) map[i] = 1;
    cidFont.replaceKey("/CIDToGIDMap", QPDFObjectHandle::newStream(&pdf, map));
  } else {
    cidFont.replaceKey("/CIDToGIDMap", name("/Identity"));
  }
  cidFont.replaceKey("/FontDescriptor", pdf.makeIndirectObject(descriptor));
  auto font = QPDFObjectHandle::parse(
      "<< /Type /Font /Subtype /Type0 /BaseFont /CorvelTextLayer /Encoding /Identity-H >>");
  font.replaceKey("/DescendantFonts",
                  QPDFObjectHandle::newArray({pdf.makeIndirectObject(cidFont)}));
  font.replaceKey("/ToUnicode", QPDFObjectHandle::newStream(&pdf, identityToUnicode()));
  return pdf.makeIndirectObject(font);
}

// The content stream that draws `lines` invisibly on a page of `frame` with the font
// named `fontName` in the page's resources.
std::string textLayer(const std::vector<TextLayerLine>& lines, const PageFrame& frame,
                      const std::string& fontName) {
  std::string out = "BT\n3 Tr\n";
  double width = frame.displayWidth(), height = frame.displayHeight();
  // The text's axes on the displayed page, in user space: a rotated page turns them.
  double ox = 0, oy = 0, xx = 0, xy = 0, yx = 0, yy = 0;
  frame.toUser(0, 0, &ox, &oy);
  frame.toUser(1, 0, &xx, &xy);
  frame.toUser(0, 1, &yx, &yy);
  xx -= ox, xy -= oy, yx -= ox, yy -= oy;
  for (const auto& line : lines) {
    // The line's height is the font size of its words, and its baseline sits the font's
    // descent above the line's bottom.
    double size = line.boundingBox.size.height * height;
    double baseline = line.boundingBox.origin.y * height - kDescent / 1000.0 * size;
    if (!(size > 0.5) || !std::isfinite(size + baseline)) continue;
    for (const auto& word : line.words) {
      const Rect& box = word.boundingBox;
      double boxWidth = box.size.width * width;
      std::string codes;
      std::size_t count = 0;
      for (char16_t unit : word.text) {
        // One code per code unit of the basic plane; a character beyond it is one
        // replacement character, so a word's length on the page stays right.
        if (unit >= 0xDC00 && unit <= 0xDFFF) continue;
        if (unit >= 0xD800 && unit <= 0xDBFF) unit = 0xFFFD;
        char hex[8];
        std::snprintf(hex, sizeof hex, "%04X", static_cast<unsigned>(unit));
        codes += hex;
        ++count;
      }
      if (count == 0 || !(boxWidth > 0) || !std::isfinite(boxWidth + box.origin.x)) continue;
      double stretch =
          100.0 * boxWidth / (static_cast<double>(count) * size * kGlyphWidth / 1000.0);
      double ux = 0, uy = 0;
      frame.toUser(box.origin.x * width, baseline, &ux, &uy);
      out += fontName + " " + number(size) + " Tf " + number(stretch) + " Tz " + number(xx) + " " +
             number(xy) + " " + number(yx) + " " + number(yy) + " " + number(ux) + " " +
             number(uy) + " Tm <" + codes + "> Tj\n";
    }
  }
  return out + "ET\n";
}

// A resource name not yet used in `dictionary`.
std::string freshName(QPDFObjectHandle dictionary, const std::string& base) {
  std::string candidate = base;
  for (int i = 1; dictionary.isDictionary() && dictionary.hasKey(candidate); ++i) {
    candidate = base + std::to_string(i);
  }
  return candidate;
}

// Adds the text layer to one page of a PDF: its content is wrapped in q ... Q so that no
// state it leaves behind moves the text.
void graftLayer(QPDF& pdf, QPDFPageObjectHelper& page, const std::vector<TextLayerLine>& lines,
                QPDFObjectHandle font) {
  PageFrame frame = pageFrame(page);
  auto resources = page.getAttribute("/Resources", true);
  if (!resources.isDictionary()) {
    resources = QPDFObjectHandle::newDictionary();
    page.getObjectHandle().replaceKey("/Resources", resources);
  }
  auto fonts = resources.getKey("/Font");
  if (!fonts.isDictionary()) {
    fonts = QPDFObjectHandle::newDictionary();
    resources.replaceKey("/Font", fonts);
  }
  std::string fontName = freshName(fonts, "/CorvelOCR");
  fonts.replaceKey(fontName, font);
  page.addPageContents(QPDFObjectHandle::newStream(&pdf, "q\n"), true);
  page.addPageContents(QPDFObjectHandle::newStream(&pdf, "Q\n" + textLayer(lines, frame, fontName)),
                       false);
}

// The pixels of a page picture, produced when the writer reaches the stream, so that
// pictures are never all in memory at once.
class PicturePixels final : public QPDFObjectHandle::StreamDataProvider {
 public:
  PicturePixels(const Document& document, std::size_t page) : document_(document), page_(page) {}

  void provideStreamData(QPDFObjGen const&, Pipeline* pipeline) override {
    Error error;
    auto bitmap = document_.renderPage(page_, &error, nullptr);
    if (!bitmap) throw std::runtime_error(error.userInfoString("Error reason"));
    PIX* pix = bitmap->native().pix;
    int depth = pixGetDepth(pix);
    auto width = static_cast<std::size_t>(pixGetWidth(pix));
    std::vector<unsigned char> row(depth == 32 ? width * 3 : depth == 8 ? width : (width + 7) / 8);
    for (int y = 0; y < pixGetHeight(pix); ++y) {
      l_uint32* line = pixGetData(pix) + static_cast<std::size_t>(y) * pixGetWpl(pix);
      if (depth == 1) {
        for (std::size_t i = 0; i < row.size(); ++i)
          row[i] = static_cast<unsigned char>(GET_DATA_BYTE(line, i));
      } else if (depth == 8) {
        for (std::size_t x = 0; x < width; ++x)
          row[x] = static_cast<unsigned char>(GET_DATA_BYTE(line, x));
      } else {
        for (std::size_t x = 0; x < width; ++x) {
          l_int32 r = 0, g = 0, b = 0;
          extractRGBValues(line[x], &r, &g, &b);
          row[3 * x] = static_cast<unsigned char>(r);
          row[3 * x + 1] = static_cast<unsigned char>(g);
          row[3 * x + 2] = static_cast<unsigned char>(b);
        }
      }
      pipeline->write(row.data(), row.size());
    }
    pipeline->finish();
  }

 private:
  const Document& document_;
  std::size_t page_;
};

// The picture of page `index` as an image object, and its size in pixels and points.
struct Picture {
  QPDFObjectHandle image;
  double widthPoints = 0, heightPoints = 0;
};

Picture makePicture(QPDF& pdf, const Document& document, std::size_t index) {
  Error error;
  double resolution = 0;
  auto bitmap = document.renderPage(index, &error, &resolution);
  if (!bitmap) throw std::runtime_error(error.userInfoString("Error reason"));
  if (!(resolution > 0)) resolution = 300;
  PIX* pix = bitmap->native().pix;
  int depth = pixGetDepth(pix);
  Picture picture;
  picture.widthPoints = bitmap->width() * 72.0 / resolution;
  picture.heightPoints = bitmap->height() * 72.0 / resolution;
  auto dict = QPDFObjectHandle::parse("<< /Type /XObject /Subtype /Image >>");
  dict.replaceKey("/Width", QPDFObjectHandle::newInteger(bitmap->width()));
  dict.replaceKey("/Height", QPDFObjectHandle::newInteger(bitmap->height()));
  // A JPEG file goes in as it is: decoding and encoding it again would only lose.
  if (document.kind() == DocumentKind::Image) {
    l_int32 format = 0, w = 0, h = 0, bps = 0, spp = 0, cmap = 0;
    auto bytes = readFile(document.path());
    if (bytes && pixReadHeader(document.path().c_str(), &format, &w, &h, &bps, &spp, &cmap) == 0 &&
        format == IFF_JFIF_JPEG && bps == 8 && (spp == 1 || spp == 3) &&
        static_cast<std::uint32_t>(w) == bitmap->width() &&
        static_cast<std::uint32_t>(h) == bitmap->height()) {
      dict.replaceKey("/ColorSpace", name(spp == 1 ? "/DeviceGray" : "/DeviceRGB"));
      dict.replaceKey("/BitsPerComponent", QPDFObjectHandle::newInteger(8));
      dict.replaceKey("/Filter", name("/DCTDecode"));
      auto stream = QPDFObjectHandle::newStream(
          &pdf, std::string(reinterpret_cast<const char*>(bytes->data()), bytes->size()));
      stream.replaceDict(dict);
      picture.image = stream;
      return picture;
    }
  }
  dict.replaceKey("/ColorSpace", name(depth == 32 ? "/DeviceRGB" : "/DeviceGray"));
  dict.replaceKey("/BitsPerComponent", QPDFObjectHandle::newInteger(depth == 1 ? 1 : 8));
  // Leptonica's bilevel pictures are 1 for black, PDF's grey 1 for white.
  if (depth == 1) dict.replaceKey("/Decode", QPDFObjectHandle::parse("[1 0]"));
  auto stream = QPDFObjectHandle::newStream(&pdf);
  stream.replaceDict(dict);
  stream.replaceStreamData(std::make_shared<PicturePixels>(document, index),
                           QPDFObjectHandle::newNull(), QPDFObjectHandle::newNull());
  picture.image = stream;
  return picture;
}

void addPicturePage(QPDF& pdf, const Document& document, std::size_t index,
                    const TextLayerPage* layer, QPDFObjectHandle& font) {
  Picture picture = makePicture(pdf, document, index);
  auto page = QPDFObjectHandle::parse("<< /Type /Page /Resources << /XObject << >> >> >>");
  page.replaceKey("/MediaBox", QPDFObjectHandle::newArray(std::vector<QPDFObjectHandle>{
                                   QPDFObjectHandle::newInteger(0), QPDFObjectHandle::newInteger(0),
                                   QPDFObjectHandle::newReal(picture.widthPoints, 3),
                                   QPDFObjectHandle::newReal(picture.heightPoints, 3)}));
  page.getKey("/Resources")
      .getKey("/XObject")
      .replaceKey("/Im0", pdf.makeIndirectObject(picture.image));
  std::string content = "q " + number(picture.widthPoints) + " 0 0 " +
                        number(picture.heightPoints) + " 0 0 cm /Im0 Do Q\n";
  if (layer && layer->recognised) {
    if (font.isNull()) font = makeFont(pdf);
    auto fonts = QPDFObjectHandle::newDictionary();
    fonts.replaceKey("/CorvelOCR", font);
    page.getKey("/Resources").replaceKey("/Font", fonts);
    PageFrame frame{0, 0, picture.widthPoints, picture.heightPoints, 0};
    content += textLayer(layer->lines, frame, "/CorvelOCR");
  }
  page.replaceKey("/Contents", QPDFObjectHandle::newStream(&pdf, content));
  QPDFPageDocumentHelper(pdf).addPage(QPDFPageObjectHelper(pdf.makeIndirectObject(page)), false);
}

// A temporary file beside `path` (in the temporary folder for standard output), open
// for writing; "" when none can be made.
std::string temporaryBeside(const std::string& path, int* fd) {
  if (path == "-") {
    const char* dir = std::getenv("TMPDIR");
    std::string pattern = std::string(dir && *dir ? dir : "/tmp") + "/corvel-pdf-XXXXXX";
    *fd = mkstemp(pattern.data());
    return *fd < 0 ? "" : pattern;
  }
  std::string temporary;
  *fd = detail::createSiblingFile(path, &temporary);
  return *fd < 0 ? "" : temporary;
}

// Writes the PDF to a temporary file, so that a long document never sits in memory
// whole, reads it back, and only then renames it to `path` (or copies it to standard
// output). A damaged input that qpdf repairs one way and Poppler another can come out as
// a file whose pages a reader no longer finds: such a file is not kept.
bool emit(QPDF& pdf, std::size_t pages, const std::string& path, Error* error) {
  int fd = -1;
  std::string temporary = temporaryBeside(path, &fd);
  if (temporary.empty()) {
    *error = makeDocumentError(DocumentErrorWrite, "cannot make a temporary file for " + path);
    return false;
  }
  struct Cleanup {
    std::string path;
    ~Cleanup() {
      if (!path.empty()) ::unlink(path.c_str());
    }
  } cleanup{temporary};
  std::FILE* file = fdopen(fd, "wb");
  if (!file) {
    ::close(fd);
    *error = makeDocumentError(DocumentErrorWrite, "cannot write " + temporary);
    return false;
  }
  {
    QPDFWriter writer(pdf);
    writer.setOutputFile(temporary.c_str(), file, false);
    writer.write();
  }
  bool written = std::fflush(file) == 0 && fsync(fileno(file)) == 0;
  written = std::fclose(file) == 0 && written;
  std::unique_ptr<poppler::document> check(poppler::document::load_from_file(temporary));
  if (!written || !check || check->pages() != static_cast<int>(pages)) {
    *error = makeDocumentError(
        written ? DocumentErrorDamaged : DocumentErrorWrite,
        written ? "the PDF is too damaged to add text to: its pages do not survive"
                : "cannot write " + (path == "-" ? std::string("the PDF") : path));
    return false;
  }
  check.reset();
  if (path == "-") {
    std::FILE* in = std::fopen(temporary.c_str(), "rb");
    bool copied = in != nullptr;
    char buffer[1 << 16];
    for (std::size_t n; copied && (n = std::fread(buffer, 1, sizeof buffer, in)) > 0;) {
      copied = std::fwrite(buffer, 1, n, stdout) == n;
    }
    if (in) std::fclose(in);
    if (!copied || std::fflush(stdout) != 0) {
      *error = makeDocumentError(DocumentErrorWrite, "cannot write the PDF to standard output");
      return false;
    }
    return true;
  }
  cleanup.path.clear();  // from here the temporary file is replaceWithSibling's
  if (!detail::replaceWithSibling(temporary, path)) {
    *error = makeDocumentError(DocumentErrorWrite, "cannot write " + path);
    return false;
  }
  return true;
}

}  // namespace

bool writeSearchablePdf(const Document& document, const std::vector<TextLayerPage>& pages,
                        const std::string& path, Error* error) {
  std::map<std::size_t, const TextLayerPage*> layers;
  for (const auto& page : pages) {
    if (page.page >= document.pageCount()) {
      *error = makeDocumentError(DocumentErrorPageRange,
                                 "no page " + std::to_string(page.page + 1) + " to lay text on");
      return false;
    }
    layers[page.page] = &page;
  }
  try {
    QPDF pdf;
    pdf.setSuppressWarnings(true);
    QPDFObjectHandle font = QPDFObjectHandle::newNull();
    if (document.kind() == DocumentKind::Pdf) {
      pdf.processFile(document.path().c_str());
      QPDFPageDocumentHelper helper(pdf);
      helper.pushInheritedAttributesToPage();
      auto all = helper.getAllPages();
      if (all.size() != document.pageCount()) {
        *error =
            makeDocumentError(DocumentErrorDamaged,
                              "the PDF's pages cannot be told apart reliably enough to add text");
        return false;
      }
      for (auto& [index, layer] : layers) {
        if (!layer->recognised || layer->lines.empty()) continue;
        if (font.isNull()) font = makeFont(pdf);
        graftLayer(pdf, all[index], layer->lines, font);
      }
    } else {
      pdf.emptyPDF();
      for (std::size_t i = 0; i < document.pageCount(); ++i) {
        auto it = layers.find(i);
        addPicturePage(pdf, document, i, it == layers.end() ? nullptr : it->second, font);
      }
    }
    return emit(pdf, document.pageCount(), path, error);
  } catch (const std::exception& e) {
    *error = makeDocumentError(DocumentErrorWrite, std::string("cannot make the PDF: ") + e.what());
    return false;
  }
}

}  // namespace corvel::detail
