// Document jobs: one operation per page on the shared queue, delivered in page order.
#include "Corvelbase/RVDocumentOCR.h"

#include <map>
#include <mutex>

#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "ocr/JobRecognition.h"

namespace corvel {

struct RVDocumentOCR::JobState {
  std::shared_ptr<Document> document;
  RVVisionOCR::LanguageCodes languageCodes;  // ordered
  bool fast = false;
  PageHandler pageHandler;
  Completion completion;
  std::atomic<bool> cancelled{false};
  // Main queue only: pages done but waiting for an earlier one.
  std::map<std::size_t, RVDocumentPage> waiting;
  std::size_t next = 0;
};

std::shared_ptr<RVDocumentOCR> RVDocumentOCR::init() {
  return std::shared_ptr<RVDocumentOCR>(new RVDocumentOCR);
}

RVDocumentOCR::~RVDocumentOCR() = default;

std::shared_ptr<RVDocumentOCR> RVDocumentOCR::ocrDocumentAtPath(
    const std::string& path, RVVisionOCR::LanguageCodes languageCodes, bool useFastTextRecognition,
    PageHandler pageHandler, Completion completion) {
  auto job = init();
  job->startOcrDocumentAtPath(path, std::move(languageCodes), useFastTextRecognition,
                              std::move(pageHandler), std::move(completion));
  return job;
}

void RVDocumentOCR::startOcrDocumentAtPath(const std::string& path,
                                           RVVisionOCR::LanguageCodes languageCodes,
                                           bool useFastTextRecognition, PageHandler pageHandler,
                                           Completion completion) {
  Error error;
  auto document = Document::initWithFile(path, &error);
  if (!document) {
    MainQueue::async([completion = std::move(completion), error] {
      if (completion) completion(error);
    });
    return;
  }
  startOcrDocument(std::move(document), std::move(languageCodes), useFastTextRecognition,
                   std::move(pageHandler), std::move(completion));
}

void RVDocumentOCR::startOcrDocument(std::shared_ptr<Document> document,
                                     RVVisionOCR::LanguageCodes languageCodes,
                                     bool useFastTextRecognition, PageHandler pageHandler,
                                     Completion completion) {
  auto recognizer = PlatformRegistry::textRecognizer();
  if (!PlatformRegistry::platformVersion().isAtLeast(10, 15) || !recognizer ||
      !recognizer->isAvailable()) {
    Error error;
    error.domain = RVVisionOCRErrorDomain;
    error.code = RVVisionOCRErrorUnsupported;
    error.userInfo[RVVisionOCRErrorReasonKey] =
        PropertyList(fromUTF8(RVVisionOCRUnsupportedReason));
    MainQueue::async([completion = std::move(completion), error] {
      if (completion) completion(error);
    });
    return;
  }
  auto state = std::make_shared<JobState>();
  state->document = std::move(document);
  state->languageCodes = languageCodes.empty()
                             ? languageCodes
                             : RVVisionOCR::init()->orderLanguageCodes(languageCodes);
  state->fast = useFastTextRecognition;
  state->pageHandler = std::move(pageHandler);
  state->completion = std::move(completion);
  state_ = state;
  pageCount_ = state->document->pageCount();
  auto self = shared_from_this();
  auto queue = RVVisionOCR::ocrQueue();
  // The operations hold only the page's number: nothing is rendered until one runs.
  for (std::size_t i = 0; i < state->document->pageCount(); ++i) {
    queue->addOperation(
        BlockOperation::blockOperationWithBlock([self, state, i] { self->runPage(state, i); }));
  }
}

void RVDocumentOCR::cancel() {
  if (state_) state_->cancelled.store(true);
}

std::shared_ptr<Document> RVDocumentOCR::document() const {
  return state_ ? state_->document : nullptr;
}

void RVDocumentOCR::runPage(const std::shared_ptr<JobState>& state, std::size_t index) {
  RVDocumentPage page;
  page.index = index;
  const Document& document = *state->document;
  auto cancelledError = [] {
    return makeTextRecognitionError(TextRecognitionErrorCancelled, "the job was cancelled");
  };
  if (state->cancelled.load()) {
    page.error = cancelledError();
  } else if (String own = forceOCR_ || document.kind() != DocumentKind::Pdf
                              ? String()
                              : document.pageText(index);
             !own.empty()) {
    page.hasOwnText = true;
    page.text = std::move(own);
  } else {
    Error error;
    double resolution = 0;
    auto bitmap = document.renderPage(index, &error, &resolution);
    if (!bitmap) {
      page.error = error;
    } else {
      page.pixelSize =
          Size{static_cast<double>(bitmap->width()), static_cast<double>(bitmap->height())};
      page.resolution = resolution;
      auto request = TextRecognitionRequest::init();
      detail::configureRequest(*request, state->languageCodes, state->fast, timeout_);
      request->setCancellationCheck([state] { return state->cancelled.load(); });
      auto handler = ImageRequestHandler::initWithCGImage(std::move(bitmap), {});
      if (!handler->performRequests({request}, &error)) {
        page.error = error;
      } else {
        page.observations = request->results().value_or(std::vector<RecognizedTextObservation>());
        auto analyser = RVTextLayoutAnalyser::init();
        page.text =
            detail::orderedText(readingOrder_, page.observations, page.pixelSize, *analyser);
        page.layoutBlocks = analyser->layoutBlocks();
      }
    }
  }
  auto self = shared_from_this();
  MainQueue::async(
      [self, state, page = std::move(page)]() mutable { self->deliver(state, std::move(page)); });
}

void RVDocumentOCR::deliver(const std::shared_ptr<JobState>& state, RVDocumentPage page) {
  state->waiting.emplace(page.index, std::move(page));
  std::size_t count = state->document->pageCount();
  while (!state->waiting.empty() && state->waiting.begin()->first == state->next) {
    RVDocumentPage ready = std::move(state->waiting.begin()->second);
    state->waiting.erase(state->waiting.begin());
    ++state->next;
    ++pagesDelivered_;
    if (state->pageHandler) state->pageHandler(ready);
  }
  if (state->next == count && state->completion) {
    std::optional<Error> error;
    if (state->cancelled.load()) {
      error = makeTextRecognitionError(TextRecognitionErrorCancelled, "the job was cancelled");
    }
    auto completion = std::move(state->completion);
    state->completion = nullptr;
    completion(error);
  }
}

}  // namespace corvel
