// RVVisionOCR: text recognition of one image as a job, and the catalogue of the
// recognition languages.
//
// A job takes an image (a platform image, a bitmap, a file path or a `file:` URL),
// language codes and a speed choice, runs on the shared queue `ocrQueue` (at most 6 jobs
// at once), lets the recogniser in use (PlatformRegistry::textRecognizer) read the
// lines, turns each line into a line-level RVRecognitionBlock, lets the job's
// RVTextLayoutAnalyser put them in reading order, and calls the completion on the main
// queue (MainQueue) with the reading-order text (paragraphs and columns joined by
// "\n\n") and nullopt, or with "" and the error.
//
// Example (the program drains the default main queue itself):
//
//   auto job = RVVisionOCR::ocrImageAtPath(u"page.png", {"fr-FR"}, false,
//       [](const String& text, const std::optional<Error>& error) { ... });
//   MainQueue::runUntil([&] { return delivered; });
//
// Errors handed to the completion:
// - no recogniser (a platform version before 10.15, or no language data installed):
//   RVVisionOCRErrorDomain, code 200, "Error reason" = RVVisionOCRUnsupportedReason;
//   delivered at once on the calling thread, not on the main queue;
// - anything the recogniser reports (an image that cannot be decoded, a language that is
//   not installed, an engine failure): its own error unchanged (TextRecognitionErrorDomain,
//   with "Error reason" saying what went wrong); it is also logged as "Error: %@".
//
// Cancelling (`cancelOCRJob`, `cancelAllOCRJobs`) a job that has not started means its
// work never runs and its completion is never called. A running or finished job is not
// affected. The image is decoded lazily, on the worker that runs the job.
//
// Thread-safety: the class methods may be called from any thread, but the first call
// to `ocrQueue` (which every job start makes) is expected on the host's main thread.
// A job object is used by the thread that started it; its analyser belongs to the worker
// until the completion runs.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/String.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel {

class RVTextLayoutAnalyser;

// The job's own error: no text recognition on this system.
CORVEL_EXPORT extern const char* const RVVisionOCRErrorDomain;        // "com.corvelworks.ocr"
CORVEL_EXPORT extern const std::int64_t RVVisionOCRErrorUnsupported;  // 200
CORVEL_EXPORT extern const char* const RVVisionOCRErrorReasonKey;     // "Error reason"
CORVEL_EXPORT extern const char* const RVVisionOCRUnsupportedReason;

// Keys of a language catalogue entry.
CORVEL_EXPORT extern const char* const RVVisionLanguageIsoCodeKey;       // "isoCode"
CORVEL_EXPORT extern const char* const RVVisionLanguageNameKey;          // "name"
CORVEL_EXPORT extern const char* const RVVisionLanguageSecondaryKey;     // "secondary"
CORVEL_EXPORT extern const char* const RVVisionLanguageForcePrimaryKey;  // "forcePrimary"

// How a job orders the recognised lines into its text.
enum RVReadingOrder : std::int64_t {
  // The layout analysis (RVTextLayoutAnalyser): columns by left edge, top to bottom,
  // paragraphs and columns joined by "\n\n". The default.
  RVReadingOrderLayoutAnalysis = 0,
  // The engine's own blocks and paragraphs in its order: lines joined by "\n",
  // paragraphs by "\n\n". Keeps a form's or a receipt's rows together and does not join
  // lines of unrelated blocks; the analyser's layoutBlocks() then hold the engine's
  // blocks (columns), paragraphs and lines.
  RVReadingOrderEngine = 1,
  // The engine's order with rows kept together: side-by-side blocks whose lines pair up
  // row by row, one of them of short lines (a receipt's prices, a form's values, a
  // table's columns, a transcript's line numbers), are read row by row, each row left
  // to right on one line; blocks of long lines (an article's columns) stay apart.
  RVReadingOrderRows = 2,
};

class CORVEL_EXPORT RVVisionOCR : public std::enable_shared_from_this<RVVisionOCR> {
 public:
  // Called once with the reading-order text and nullopt, or "" and the error.
  using Completion = std::function<void(const String& text, const std::optional<Error>& error)>;
  using LanguageCodes = std::vector<std::string>;

  static std::shared_ptr<RVVisionOCR> init();
  RVVisionOCR(const RVVisionOCR&) = delete;
  RVVisionOCR& operator=(const RVVisionOCR&) = delete;
  ~RVVisionOCR();

  // --- Starting a job -----------------------------------------------------------------
  // The class forms make a new job, start it with the instance form of the same
  // arguments and return it as the handle for cancelOCRJob; the job runs on even when
  // the caller drops the handle.

  // A platform image (a null image ends in a TextRecognitionErrorImageUnreadable error).
  static std::shared_ptr<RVVisionOCR> ocrImage(std::shared_ptr<Image> image,
                                               LanguageCodes languageCodes,
                                               bool useFastTextRecognition, Completion completion);
  // Decoded pixels.
  static std::shared_ptr<RVVisionOCR> ocrCGImage(std::shared_ptr<Bitmap> image,
                                                 LanguageCodes languageCodes,
                                                 bool useFastTextRecognition,
                                                 Completion completion);
  // A file, read and decoded on the worker.
  static std::shared_ptr<RVVisionOCR> ocrImageAtPath(const String& path,
                                                     LanguageCodes languageCodes,
                                                     bool useFastTextRecognition,
                                                     Completion completion);
  // A `file:` URL; any other scheme ends in a TextRecognitionErrorImageUnreadable error.
  static std::shared_ptr<RVVisionOCR> ocrImageAtURL(const std::string& url,
                                                    LanguageCodes languageCodes,
                                                    bool useFastTextRecognition,
                                                    Completion completion);

  // The instance forms: start this job (once; a second start of the same job is not
  // supported).
  void startOcrImage(std::shared_ptr<Image> image, LanguageCodes languageCodes,
                     bool useFastTextRecognition, Completion completion);
  void startOcrCGImage(std::shared_ptr<Bitmap> image, LanguageCodes languageCodes,
                       bool useFastTextRecognition, Completion completion);
  void startOcrImageAtPath(const String& path, LanguageCodes languageCodes,
                           bool useFastTextRecognition, Completion completion);
  void startOcrImageAtURL(const std::string& url, LanguageCodes languageCodes,
                          bool useFastTextRecognition, Completion completion);

  // --- The shared queue and cancelling ---------------------------------------------------

  // The queue every job runs on, made on first use with at most 6 operations at once.
  static std::shared_ptr<OperationQueue> ocrQueue();
  // Cancels every job on the shared queue; does not make the queue.
  static void cancelAllOCRJobs();
  // Cancels this job's operation unless it has finished or is already cancelled; does
  // nothing for a job without one (an unsupported system, or not started).
  void cancelOCRJob();
  // Cancels the job as cancelOCRJob does and, when it is already running, stops its
  // recognition inside the engine: the completion is then called with "" and a
  // TextRecognitionErrorCancelled error (soon: the engine looks at the request between
  // words). cancelOCRJob leaves a running job to finish, as hosts have always had it.
  void stopOCRJob();

  // --- Recognition results ---------------------------------------------------------------

  // Adds one line-level block per observation of `request` (its best reading; the box
  // unchanged, the confidence times 100) to the analyser, in result order. Nothing on
  // a platform version before 10.15, without results or without an analyser.
  void addRecognitionBlocksToAnalyser(const TextRecognitionRequest& request);

  // --- The language catalogue ------------------------------------------------------------

  // The 14 entries by catalogue key, each a dictionary with "isoCode", "name" and, for
  // the East-Asian languages, "secondary" (["en-US"]) and "forcePrimary" (true). Built
  // once; the same object afterwards.
  static const PropertyList::Dictionary& allVisionLanguages();
  // The catalogue entries of the codes the recogniser supports at `recognitionLevel`
  // (0 accurate, 1 fast), in the recogniser's order; codes without an entry are skipped.
  // nullopt before platform version 10.15, and when the recogniser reports an error
  // (logged as "Error getting Vision Languages: %@") or gives no list.
  static std::optional<std::vector<PropertyList>> supportedLanguages(std::int64_t recognitionLevel);
  // True for an empty list, or when the first code has a "secondary" list and every
  // code is the first code or one of its secondary codes. Any code outside the
  // catalogue makes the list invalid, and so does a first code without secondary codes
  // (even ["en-US"] alone).
  static bool isLanguageCombinationValid(const LanguageCodes& codes);
  // False when "zh-Hans" is among the codes, true otherwise.
  static bool supportFastRecognition(const LanguageCodes& codes);
  // A copy of `codes` where the first code whose entry has "forcePrimary" has moved to
  // the front; everything else keeps its order.
  LanguageCodes orderLanguageCodes(const LanguageCodes& codes) const;

  // --- Options (set before the job starts) ------------------------------------------------

  // The order of the text given to the completion; RVReadingOrderLayoutAnalysis unless set.
  RVReadingOrder readingOrder() const { return readingOrder_; }
  void setReadingOrder(RVReadingOrder order) { readingOrder_ = order; }
  // The longest the recognition may take, in seconds; a page past it ends with ""
  // and a TextRecognitionErrorTimedOut error. 0 (the default): the recogniser's own
  // deadline, which grows with the page's size.
  double timeout() const { return timeout_; }
  void setTimeout(double seconds) { timeout_ = seconds; }

  // --- Properties --------------------------------------------------------------------------

  // A flag callers may keep on the job; recognition does not look at it.
  bool cancelOCR() const { return cancelOCR_; }
  void setCancelOCR(bool cancel) { cancelOCR_ = cancel; }
  // The job's analyser, made when the job starts (nullptr before, and on an unsupported
  // system). Read it from the completion on: until then the worker owns it.
  const std::shared_ptr<RVTextLayoutAnalyser>& layoutAnalyser() const { return layoutAnalyser_; }
  const std::shared_ptr<BlockOperation>& ocrOperation() const { return ocrOperation_; }
  void setOcrOperation(std::shared_ptr<BlockOperation> operation) {
    ocrOperation_ = std::move(operation);
  }
  const Completion& completion() const { return completion_; }
  void setCompletion(Completion completion) { completion_ = std::move(completion); }

 private:
  RVVisionOCR() = default;
  struct JobState;
  void startJob(std::shared_ptr<Image> image, LanguageCodes languageCodes,
                bool useFastTextRecognition, Completion completion);
  void runJob(const std::shared_ptr<JobState>& state, const LanguageCodes& languageCodes,
              bool useFastTextRecognition);

  bool cancelOCR_ = false;
  RVReadingOrder readingOrder_ = RVReadingOrderLayoutAnalysis;
  double timeout_ = 0;
  std::shared_ptr<JobState> state_;
  std::shared_ptr<RVTextLayoutAnalyser> layoutAnalyser_;
  std::shared_ptr<BlockOperation> ocrOperation_;
  Completion completion_;
};

}  // namespace corvel
