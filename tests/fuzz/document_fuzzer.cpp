// Documents (PDF through Poppler and qpdf, TIFF pages through Leptonica, or any image):
// whatever the bytes, opening gives a document or an error; an open document has pages,
// each renders within the pixel budget or fails with a reason; a page past the end is
// refused; and the searchable PDF made of it opens again with the same number of pages.
#include <unistd.h>

#include <cstdio>
#include <string>

#include "Corvelbase/platform/Document.h"
#include "Corvelbase/platform/Files.h"
#include "FuzzSupport.h"

using namespace corvel;

namespace {

// The pages a run renders: a PDF of a thousand pages costs no more than one of three.
constexpr std::size_t kPagesRendered = 3;

std::string temporaryPath(const char* suffix) {
  return "/tmp/corvel-fuzz-document-" + std::to_string(getpid()) + suffix;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string path = temporaryPath(".in"), out = temporaryPath(".pdf");
  FUZZ_CHECK(writeFileAtomically(path, data, size));
  Error error;
  auto document = Document::initWithFile(path, &error);
  if (!document) {
    FUZZ_CHECK(error.domain == DocumentErrorDomain);
    FUZZ_CHECK(!error.userInfoString("Error reason").empty());
  } else {
    FUZZ_CHECK(document->pageCount() >= 1);
    std::vector<TextLayerPage> layers;
    for (std::size_t i = 0; i < document->pageCount() && i < kPagesRendered; ++i) {
      double resolution = -1;
      auto bitmap = document->renderPage(i, &error, &resolution);
      if (!bitmap) {
        FUZZ_CHECK(!error.userInfoString("Error reason").empty());
        continue;
      }
      std::uint64_t width = bitmap->width(), height = bitmap->height();
      FUZZ_CHECK(width > 0 && height > 0 && width * height <= kMaxImagePixels);
      FUZZ_CHECK(resolution >= 0);
      document->pageText(i);
      layers.push_back(
          {i, true, {{Rect(0.1, 0.1, 0.5, 0.1), {{u"word", Rect(0.1, 0.1, 0.2, 0.1)}}}}});
    }
    FUZZ_CHECK(!document->renderPage(document->pageCount(), &error, nullptr));
    FUZZ_CHECK(error.code == DocumentErrorPageRange);
    if (document->pageCount() <= kPagesRendered &&
        writeSearchablePdf(*document, layers, out, &error)) {
      auto again = Document::initWithFile(out, &error);
      FUZZ_CHECK(again);
      FUZZ_CHECK(again->pageCount() == document->pageCount());
    }
  }
  std::remove(path.c_str());
  std::remove(out.c_str());
  return 0;
}
