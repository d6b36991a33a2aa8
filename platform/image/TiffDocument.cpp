// Multi-page TIFF documents through Leptonica (which reads TIFF with libtiff): every
// page, each decoded only when it is asked for.
#include <cstdio>
#include <mutex>

#include "Corvelbase/platform/Image.h"
#include "platform/DocumentBackends.h"
#include "platform/image/BitmapNative.h"

namespace corvel::detail {

namespace {

bool withinBudget(l_int32 width, l_int32 height) {
  return width > 0 && height > 0 &&
         static_cast<std::uint64_t>(width) * static_cast<std::uint64_t>(height) <= kMaxImagePixels;
}

class TiffDocument final : public Document {
 public:
  TiffDocument(std::string path, std::size_t pages) : Document(std::move(path)), pages_(pages) {}
  DocumentKind kind() const override { return DocumentKind::Tiff; }
  std::size_t pageCount() const override { return pages_; }

  std::shared_ptr<Bitmap> renderPage(std::size_t page, Error* error,
                                     double* resolution) const override {
    if (page >= pages_) {
      *error =
          makeDocumentError(DocumentErrorPageRange, "the TIFF has " + std::to_string(pages_) +
                                                        " pages, not " + std::to_string(page + 1));
      return nullptr;
    }
    auto n = static_cast<l_int32>(page);
    quietLeptonica();
    std::string said;  // what libtiff or Leptonica had to say about a damaged page
    Collecting collecting(&said);
    l_int32 width = 0, height = 0, bps = 0, spp = 0, res = 0, cmap = 0, format = 0;
    if (readHeaderTiff(path().c_str(), n, &width, &height, &bps, &spp, &res, &cmap, &format) != 0) {
      *error = makeDocumentError(DocumentErrorDamaged, "page " + std::to_string(page + 1) +
                                                           " of the TIFF is damaged" +
                                                           (said.empty() ? "" : " (" + said + ")"));
      return nullptr;
    }
    if (!withinBudget(width, height)) {
      *error = makeDocumentError(DocumentErrorDamaged, "page " + std::to_string(page + 1) +
                                                           " of the TIFF is too large (" +
                                                           std::to_string(width) + " x " +
                                                           std::to_string(height) + " pixels)");
      return nullptr;
    }
    std::string failure;
    auto bitmap = bitmapFromPix(pixReadTiff(path().c_str(), n), &failure);
    if (failure.empty()) failure = said;
    if (!bitmap) {
      *error = makeDocumentError(DocumentErrorDamaged,
                                 "page " + std::to_string(page + 1) + " of the TIFF is damaged" +
                                     (failure.empty() ? "" : " (" + failure + ")"));
      return nullptr;
    }
    if (resolution) *resolution = bitmapResolution(*bitmap);
    return bitmap;
  }

 private:
  std::size_t pages_;
};

}  // namespace

double bitmapResolution(const Bitmap& bitmap) {
  return std::max(0, pixGetYRes(bitmap.native().pix));
}

bool probeImage(const std::string& path, Error* error) {
  quietLeptonica();
  std::string said;
  Collecting collecting(&said);
  l_int32 format = 0, width = 0, height = 0, bps = 0, spp = 0, cmap = 0;
  if (pixReadHeader(path.c_str(), &format, &width, &height, &bps, &spp, &cmap) != 0 ||
      format == IFF_UNKNOWN) {
    *error = makeDocumentError(DocumentErrorUnreadable,
                               "the file is neither a PDF nor an image in a supported format");
    return false;
  }
  if (!withinBudget(width, height)) {
    *error = makeDocumentError(DocumentErrorUnreadable, "the image is too large (" +
                                                            std::to_string(width) + " x " +
                                                            std::to_string(height) + " pixels)");
    return false;
  }
  return true;
}

std::shared_ptr<Document> openTiff(const std::string& path, Error* error) {
  quietLeptonica();
  std::string said;
  Collecting collecting(&said);
  std::FILE* file = std::fopen(path.c_str(), "rb");
  l_int32 pages = 0;
  bool counted = file && tiffGetCount(file, &pages) == 0 && pages > 0;
  if (file) std::fclose(file);
  if (!counted) {
    *error = makeDocumentError(DocumentErrorDamaged, "the TIFF is damaged: no page can be read" +
                                                         (said.empty() ? "" : " (" + said + ")"));
    return nullptr;
  }
  return std::make_shared<TiffDocument>(path, static_cast<std::size_t>(pages));
}

}  // namespace corvel::detail
