// RVDocumentOCR: text recognition of a whole document (a PDF, a multi-page TIFF, or one
// image) as one job, page by page.
//
// Each page becomes an operation on the same shared queue as the image jobs
// (RVVisionOCR::ocrQueue), so documents and images share its limit and the recogniser's
// limit on recognitions at once. A page is rendered or decoded only when its operation
// runs and let go when it is read, so memory stays that of the pages the queue runs at
// once, however long the document.
//
// The page handler is called on the main queue once for every page, in page order, as
// soon as the page and all before it are done; the completion follows the last page.
//
//   auto job = RVDocumentOCR::ocrDocumentAtPath("scan.pdf", {"en-US"}, false,
//       [](const RVDocumentPage& page) { ... page.text ... },
//       [](const std::optional<Error>& error) { done = true; });
//   MainQueue::runUntil([&] { return done; });
//
// A PDF page that already holds text (typed text, or an earlier text layer) is not read
// again unless setForceOCR(true): it is delivered with `hasOwnText` set and that text.
//
// Thread-safety: start a job once, from one thread; cancel() and the counters may be
// called from any thread.
#pragma once

#include <atomic>
#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Document.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel {

// The outcome of one page.
struct CORVEL_EXPORT RVDocumentPage {
  std::size_t index = 0;  // from 0
  Size pixelSize;         // of the picture read (zero when the page was not read)
  double resolution = 0;  // its pixels per inch; 0 when the image does not say
  String text;            // in the job's reading order
  // The recognised lines in the engine's order, with their words; boxes normalised to
  // the page (origin bottom left).
  std::vector<RecognizedTextObservation> observations;
  // The page's block tree in the job's reading order (columns, paragraphs, lines).
  std::shared_ptr<RVBlockArray> layoutBlocks;
  // A PDF page with text of its own, left as it is: `text` is that text.
  bool hasOwnText = false;
  // Set when the page could not be read (rendering, recognition, a timeout, cancelling).
  std::optional<Error> error;
};

class CORVEL_EXPORT RVDocumentOCR : public std::enable_shared_from_this<RVDocumentOCR> {
 public:
  using PageHandler = std::function<void(const RVDocumentPage& page)>;
  // nullopt when every page was delivered (each with its own error, if any); the
  // document's error when it could not be opened; a TextRecognitionErrorCancelled error
  // after cancel().
  using Completion = std::function<void(const std::optional<Error>& error)>;

  static std::shared_ptr<RVDocumentOCR> init();
  RVDocumentOCR(const RVDocumentOCR&) = delete;
  RVDocumentOCR& operator=(const RVDocumentOCR&) = delete;
  ~RVDocumentOCR();

  // Opens `path` (Document::initWithFile) and starts the job; a document that cannot be
  // opened, or a system without text recognition, ends the job at once with the error,
  // through the main queue.
  static std::shared_ptr<RVDocumentOCR> ocrDocumentAtPath(const std::string& path,
                                                          RVVisionOCR::LanguageCodes languageCodes,
                                                          bool useFastTextRecognition,
                                                          PageHandler pageHandler,
                                                          Completion completion);
  void startOcrDocumentAtPath(const std::string& path, RVVisionOCR::LanguageCodes languageCodes,
                              bool useFastTextRecognition, PageHandler pageHandler,
                              Completion completion);
  // On a document already open (not null).
  void startOcrDocument(std::shared_ptr<Document> document,
                        RVVisionOCR::LanguageCodes languageCodes, bool useFastTextRecognition,
                        PageHandler pageHandler, Completion completion);

  // Pages not yet read are delivered with a TextRecognitionErrorCancelled error and are
  // never rendered; pages being read are stopped inside the engine.
  void cancel();

  // The document's pages (0 before it is open) and how many have been delivered.
  std::size_t pageCount() const { return pageCount_.load(); }
  std::size_t pagesDelivered() const { return pagesDelivered_.load(); }
  // The open document; nullptr before it is open or when it could not be.
  std::shared_ptr<Document> document() const;

  // --- Options (set before the job starts) --------------------------------------------
  RVReadingOrder readingOrder() const { return readingOrder_; }
  void setReadingOrder(RVReadingOrder order) { readingOrder_ = order; }
  // Seconds each page's recognition may take; 0: the recogniser's own deadline.
  double timeout() const { return timeout_; }
  void setTimeout(double seconds) { timeout_ = seconds; }
  // Read PDF pages that already hold text as well.
  bool forceOCR() const { return forceOCR_; }
  void setForceOCR(bool force) { forceOCR_ = force; }

 private:
  RVDocumentOCR() = default;
  struct JobState;
  void runPage(const std::shared_ptr<JobState>& state, std::size_t index);
  void deliver(const std::shared_ptr<JobState>& state, RVDocumentPage page);

  RVReadingOrder readingOrder_ = RVReadingOrderLayoutAnalysis;
  double timeout_ = 0;
  bool forceOCR_ = false;
  std::atomic<std::size_t> pageCount_{0};
  std::atomic<std::size_t> pagesDelivered_{0};
  std::shared_ptr<JobState> state_;
};

}  // namespace corvel
