// Documents of pages: a PDF (read with Poppler), a multi-page TIFF (every page, with
// Leptonica), or any single image the image layer reads; and the searchable PDF made
// from one (the text layer grafted on with qpdf).
//
// A `Document` is opened from a file and reads its pages only when they are asked for,
// one at a time, so a thousand-page PDF costs no more memory than one page: a host that
// recognises pages as a queue reaches them never holds more than the queue runs at once.
// The file must stay in place while the document is used.
//
// Thread-safety: every member may be called from several threads at once; pages of one
// PDF are rendered one after another (the PDF library shares state between pages).
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The domain of document errors; "Error reason" holds a sentence saying what went wrong.
CORVEL_EXPORT extern const char* const DocumentErrorDomain;
CORVEL_EXPORT Error makeDocumentError(std::int64_t code, const std::string& reason);
enum DocumentErrorCode : std::int64_t {
  DocumentErrorUnreadable = 1,  // no such file, or neither a PDF nor an image we read
  DocumentErrorDamaged = 2,     // a PDF or TIFF too broken to read (or a page of one)
  DocumentErrorEncrypted = 3,   // a PDF that needs a password
  DocumentErrorPageRange = 4,   // no such page
  DocumentErrorWrite = 5,       // the output could not be made or written
};

enum class DocumentKind { Image, Tiff, Pdf };

class CORVEL_EXPORT Document {
 public:
  // Opens `path`; nullptr with *error (if given) when it is missing, neither a PDF nor a
  // readable image, or a PDF that is damaged past repair or wants a password.
  static std::shared_ptr<Document> initWithFile(const std::string& path, Error* error);

  Document(const Document&) = delete;
  Document& operator=(const Document&) = delete;
  virtual ~Document();

  virtual DocumentKind kind() const = 0;
  const std::string& path() const { return path_; }
  // At least 1.
  virtual std::size_t pageCount() const = 0;
  // The page's pixels, and in *resolution (if given) their pixels per inch, 0 when an
  // image does not state it. A PDF page is rendered in grey at the native resolution of
  // its largest scanned picture (kept within 72 to 600), or at 300 when it has none.
  // nullptr with *error (never null) for a page past the end or one that cannot be read.
  virtual std::shared_ptr<Bitmap> renderPage(std::size_t page, Error* error,
                                             double* resolution) const = 0;
  // The text a PDF page already holds (its own or another program's text layer), with
  // white space trimmed; "" for images and pages without text.
  virtual String pageText(std::size_t /*page*/) const { return String(); }

 protected:
  explicit Document(std::string path) : path_(std::move(path)) {}

 private:
  std::string path_;
};

// One word of a text layer: its text and its box, normalised to the page as displayed
// (0 to 1, origin at the bottom left).
struct TextLayerWord {
  String text;
  Rect boundingBox;
};

// A line of words: the line's box gives the words their height and common baseline, so
// that readers and viewers see one line of text; the words' boxes give their places
// along it.
struct TextLayerLine {
  Rect boundingBox;
  std::vector<TextLayerWord> words;
};

// The lines to lay over one page of a document; a page without an entry, or with
// `recognised` false, is written as it is.
struct TextLayerPage {
  std::size_t page = 0;
  bool recognised = false;
  std::vector<TextLayerLine> lines;
};

// Writes `document` as a PDF whose pages carry `pages`' words as invisible text that
// viewers select and search in place. A PDF keeps everything it had (content, pictures,
// fonts, metadata, outline, annotations); its pages only gain the layer. Images and TIFF
// pages become pages of their own (sized by their resolution, 300 dpi when not stated),
// JPEG files embedded as they are, other pictures losslessly. `path` "-" writes to
// standard output; a file is written atomically (a temporary file renamed). False with
// *error (never null) on failure; nothing is left at `path` then.
CORVEL_EXPORT bool writeSearchablePdf(const Document& document,
                                      const std::vector<TextLayerPage>& pages,
                                      const std::string& path, Error* error);

}  // namespace corvel
