// PDF documents: pages rendered with Poppler, at the resolution of the page's scanned
// picture, which qpdf reads from the page's resources without touching its content.
#include <poppler/cpp/poppler-document.h>
#include <poppler/cpp/poppler-global.h>
#include <poppler/cpp/poppler-page-renderer.h>
#include <poppler/cpp/poppler-page.h>
#include <qpdf/QPDF.hh>
#include <qpdf/QPDFPageDocumentHelper.hh>
#include <qpdf/QPDFPageObjectHelper.hh>

#include <algorithm>
#include <cmath>
#include <mutex>

#include "platform/DocumentBackends.h"
#include "platform/image/BitmapNative.h"
#include "platform/pdf/PdfPages.h"

namespace corvel::detail {

namespace {

constexpr double kDefaultResolution = 300;
constexpr double kMinResolution = 72;
constexpr double kMaxResolution = 600;
// A page rendered larger than this is rendered at a lower resolution: a poster-sized
// page at 300 dpi would be gigapixels.
constexpr double kMaxPagePixels = 60e6;

// Poppler reports damage on stderr; a damaged page shows up as a failed rendering.
void quietPoppler() {
  static std::once_flag once;
  std::call_once(
      once, [] { poppler::set_debug_error_function([](const std::string&, void*) {}, nullptr); });
}

// The resolution of the page's largest scanned picture: its pixels over the page's
// area. A picture that would come out under 72 dpi covers only part of the page (a logo,
// a photograph in the text): the page then has no scan, and is read at 300 dpi.
double scanResolution(QPDFPageObjectHelper& page) {
  PageFrame frame = pageFrame(page);
  double area = frame.width * frame.height / (72.0 * 72.0);  // square inches
  double best = 0, bestPixels = 0;
  for (auto& [name, image] : page.getImages()) {
    auto dict = image.getDict();
    if (!dict.getKey("/Width").isNumber() || !dict.getKey("/Height").isNumber()) continue;
    double pixels =
        dict.getKey("/Width").getNumericValue() * dict.getKey("/Height").getNumericValue();
    if (pixels > bestPixels && area > 0) {
      bestPixels = pixels;
      best = std::sqrt(pixels / area);
    }
  }
  if (!(best >= kMinResolution)) return kDefaultResolution;
  return std::min(best, kMaxResolution);
}

class PdfDocument final : public Document {
 public:
  PdfDocument(std::string path, std::unique_ptr<poppler::document> pdf,
              std::vector<double> resolutions)
      : Document(std::move(path)), pdf_(std::move(pdf)), resolutions_(std::move(resolutions)) {}

  DocumentKind kind() const override { return DocumentKind::Pdf; }
  std::size_t pageCount() const override { return resolutions_.size(); }

  std::shared_ptr<Bitmap> renderPage(std::size_t index, Error* error,
                                     double* resolution) const override {
    if (index >= resolutions_.size()) {
      *error = makeDocumentError(DocumentErrorPageRange,
                                 "the PDF has " + std::to_string(resolutions_.size()) +
                                     " pages, not " + std::to_string(index + 1));
      return nullptr;
    }
    std::string pageName = "page " + std::to_string(index + 1);
    std::lock_guard lock(mutex_);
    std::unique_ptr<poppler::page> page(pdf_->create_page(static_cast<int>(index)));
    if (!page) {
      *error = makeDocumentError(DocumentErrorDamaged, pageName + " of the PDF is damaged");
      return nullptr;
    }
    poppler::rectf box = page->page_rect(poppler::crop_box);
    double dpi = resolutions_[index];
    double pixels = box.width() * box.height() * dpi * dpi / (72.0 * 72.0);
    if (pixels > kMaxPagePixels) dpi *= std::sqrt(kMaxPagePixels / pixels);
    poppler::page_renderer renderer;
    renderer.set_image_format(poppler::image::format_gray8);
    renderer.set_render_hints(poppler::page_renderer::antialiasing |
                              poppler::page_renderer::text_antialiasing);
    poppler::image image = renderer.render_page(page.get(), dpi, dpi);
    if (!image.is_valid() || image.width() <= 0 || image.height() <= 0 ||
        image.format() != poppler::image::format_gray8) {
      *error =
          makeDocumentError(DocumentErrorDamaged, pageName + " of the PDF could not be rendered");
      return nullptr;
    }
    auto width = static_cast<std::uint32_t>(image.width());
    auto height = static_cast<std::uint32_t>(image.height());
    PIX* pix = createPagePix(width, height, 8);
    if (!pix) {
      *error = makeDocumentError(DocumentErrorDamaged, pageName + " is too large to render");
      return nullptr;
    }
    const char* rows = image.const_data();
    for (std::uint32_t y = 0; y < height; ++y) {
      packGreyRow(pixGetData(pix) + static_cast<std::size_t>(y) * pixGetWpl(pix),
                  reinterpret_cast<const std::uint8_t*>(rows) +
                      static_cast<std::size_t>(y) * static_cast<std::size_t>(image.bytes_per_row()),
                  width);
    }
    auto rounded = static_cast<l_int32>(std::lround(dpi));
    pixSetResolution(pix, rounded, rounded);
    std::string failure;
    auto bitmap = bitmapFromPix(pix, &failure);
    if (!bitmap) {
      *error = makeDocumentError(DocumentErrorDamaged, pageName + ": " + failure);
      return nullptr;
    }
    if (resolution) *resolution = dpi;
    return bitmap;
  }

  String pageText(std::size_t index) const override {
    if (index >= resolutions_.size()) return String();
    std::lock_guard lock(mutex_);
    std::unique_ptr<poppler::page> page(pdf_->create_page(static_cast<int>(index)));
    if (!page) return String();
    poppler::byte_array utf8 = page->text().to_utf8();
    std::string text(utf8.begin(), utf8.end());
    auto isSpace = [](unsigned char c) { return c <= ' '; };
    while (!text.empty() && isSpace(static_cast<unsigned char>(text.back()))) text.pop_back();
    std::size_t start = 0;
    while (start < text.size() && isSpace(static_cast<unsigned char>(text[start]))) ++start;
    return fromUTF8(text.substr(start));
  }

 private:
  mutable std::mutex mutex_;
  std::unique_ptr<poppler::document> pdf_;
  std::vector<double> resolutions_;
};

}  // namespace

std::shared_ptr<Document> openPdf(const std::string& path, Error* error) {
  quietPoppler();
  std::unique_ptr<poppler::document> pdf(poppler::document::load_from_file(path));
  if (!pdf) {
    *error = makeDocumentError(DocumentErrorDamaged, "the PDF is damaged and cannot be read");
    return nullptr;
  }
  if (pdf->is_locked()) {
    *error = makeDocumentError(DocumentErrorEncrypted, "the PDF needs a password");
    return nullptr;
  }
  std::vector<double> resolutions;
  try {
    QPDF qpdf;
    qpdf.setSuppressWarnings(true);
    qpdf.processFile(path.c_str());
    for (auto& page : QPDFPageDocumentHelper(qpdf).getAllPages()) {
      resolutions.push_back(scanResolution(page));
    }
  } catch (const std::exception&) {
    // qpdf cannot read what Poppler could: no resolutions to go by.
    resolutions.clear();
  }
  auto pages = static_cast<std::size_t>(std::max(0, pdf->pages()));
  if (pages == 0) {
    *error = makeDocumentError(DocumentErrorDamaged, "the PDF has no pages");
    return nullptr;
  }
  // The two libraries read a damaged file differently: unless they agree on its pages,
  // no resolution is taken from qpdf's reading.
  if (resolutions.size() != pages) resolutions.assign(pages, kDefaultResolution);
  return std::make_shared<PdfDocument>(path, std::move(pdf), std::move(resolutions));
}

}  // namespace corvel::detail
