// Opening a document: the first bytes of the file choose the backend (PDF, TIFF, or the
// image layer for any other picture).
#include "Corvelbase/platform/Document.h"

#include <cstdio>
#include <cstring>

#include "platform/DocumentBackends.h"

namespace corvel {

const char* const DocumentErrorDomain = "com.corvelworks.document";

Error makeDocumentError(std::int64_t code, const std::string& reason) {
  Error error;
  error.domain = DocumentErrorDomain;
  error.code = code;
  error.userInfo["Error reason"] = PropertyList(fromUTF8(reason));
  return error;
}

Document::~Document() = default;

namespace {

// One picture file: decoded afresh for every rendering, so nothing stays in memory
// between the recognition and the writing of an output.
class ImageDocument final : public Document {
 public:
  explicit ImageDocument(std::string path) : Document(std::move(path)) {}
  DocumentKind kind() const override { return DocumentKind::Image; }
  std::size_t pageCount() const override { return 1; }
  std::shared_ptr<Bitmap> renderPage(std::size_t page, Error* error,
                                     double* resolution) const override {
    if (page != 0) {
      *error = makeDocumentError(DocumentErrorPageRange, "an image has one page");
      return nullptr;
    }
    auto image = Image::initByReferencingFile(path());
    auto bitmap = image->bitmap();
    if (!bitmap) {
      *error = makeDocumentError(DocumentErrorUnreadable, image->failureReason());
      return nullptr;
    }
    if (resolution) *resolution = detail::bitmapResolution(*bitmap);
    return bitmap;
  }
};

}  // namespace

std::shared_ptr<Document> Document::initWithFile(const std::string& path, Error* error) {
  Error ignored;
  Error* out = error ? error : &ignored;
  std::FILE* file = std::fopen(path.c_str(), "rb");
  if (!file) {
    *out = makeDocumentError(DocumentErrorUnreadable,
                             "cannot open the file (" + std::string(std::strerror(errno)) + ")");
    return nullptr;
  }
  // A PDF may have a little junk before its header; readers accept it within 1 KiB.
  char head[1024];
  std::size_t size = std::fread(head, 1, sizeof head, file);
  std::fclose(file);
  std::string_view start(head, size);
  if (start.find("%PDF-") != std::string_view::npos) return detail::openPdf(path, out);
  if (start.starts_with(std::string_view("II*\0", 4)) ||
      start.starts_with(std::string_view("MM\0*", 4))) {
    return detail::openTiff(path, out);
  }
  // Only the header is read now, to tell a picture from anything else.
  if (!detail::probeImage(path, out)) return nullptr;
  return std::shared_ptr<Document>(new ImageDocument(path));
}

bool writeSearchablePdf(const Document& document, const std::vector<TextLayerPage>& pages,
                        const std::string& path, Error* error) {
  return detail::writeSearchablePdf(document, pages, path, error);
}

}  // namespace corvel
