// Recognition jobs: starting, queueing, the recognition request per platform version,
// the conversion of observations into blocks and the delivery on the main queue.
#include "Corvelbase/RVVisionOCR.h"

#include <atomic>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Platform.h"
#include "ocr/JobRecognition.h"

namespace corvel {

const char* const RVVisionOCRErrorDomain = "com.corvelworks.ocr";
const std::int64_t RVVisionOCRErrorUnsupported = 200;
const char* const RVVisionOCRErrorReasonKey = "Error reason";
// Wording kept as hosts know it.
const char* const RVVisionOCRUnsupportedReason =
    "Vision OCR not support on this version of operating system";

namespace {

constexpr const char* kErrorLogFormat = "Error: %@";
constexpr std::int64_t kMaxConcurrentJobs = 6;
constexpr std::int64_t kHorizontalWritingDirection = 0;

// The shared queue, made by the first call and never released.
std::atomic<OperationQueue*> sharedQueue{nullptr};

bool recognitionAvailable() {
  if (!PlatformRegistry::platformVersion().isAtLeast(10, 15)) return false;
  auto recognizer = PlatformRegistry::textRecognizer();
  return recognizer && recognizer->isAvailable();
}

Error unsupportedError() {
  Error error;
  error.domain = RVVisionOCRErrorDomain;
  error.code = RVVisionOCRErrorUnsupported;
  error.userInfo[RVVisionOCRErrorReasonKey] = PropertyList(fromUTF8(RVVisionOCRUnsupportedReason));
  return error;
}

std::string withObject(const char* format, const std::string& value) {
  std::string out = format;
  out.replace(out.find("%@"), 2, value);
  return out;
}

}  // namespace

// What the stages of one job share: the image until delivery, and the error slot.
struct RVVisionOCR::JobState {
  std::shared_ptr<Image> image;
  std::optional<Error> error;
  std::atomic<bool> stopped{false};  // stopOCRJob: the engine is asked to stop
};

std::shared_ptr<RVVisionOCR> RVVisionOCR::init() {
  return std::shared_ptr<RVVisionOCR>(new RVVisionOCR);
}

RVVisionOCR::~RVVisionOCR() = default;

// --- class forms --------------------------------------------------------------------

std::shared_ptr<RVVisionOCR> RVVisionOCR::ocrImage(std::shared_ptr<Image> image,
                                                   LanguageCodes languageCodes,
                                                   bool useFastTextRecognition,
                                                   Completion completion) {
  auto job = init();
  job->startOcrImage(std::move(image), std::move(languageCodes), useFastTextRecognition,
                     std::move(completion));
  return job;
}

std::shared_ptr<RVVisionOCR> RVVisionOCR::ocrCGImage(std::shared_ptr<Bitmap> image,
                                                     LanguageCodes languageCodes,
                                                     bool useFastTextRecognition,
                                                     Completion completion) {
  auto job = init();
  job->startOcrCGImage(std::move(image), std::move(languageCodes), useFastTextRecognition,
                       std::move(completion));
  return job;
}

std::shared_ptr<RVVisionOCR> RVVisionOCR::ocrImageAtPath(const String& path,
                                                         LanguageCodes languageCodes,
                                                         bool useFastTextRecognition,
                                                         Completion completion) {
  auto job = init();
  job->startOcrImageAtPath(path, std::move(languageCodes), useFastTextRecognition,
                           std::move(completion));
  return job;
}

std::shared_ptr<RVVisionOCR> RVVisionOCR::ocrImageAtURL(const std::string& url,
                                                        LanguageCodes languageCodes,
                                                        bool useFastTextRecognition,
                                                        Completion completion) {
  auto job = init();
  job->startOcrImageAtURL(url, std::move(languageCodes), useFastTextRecognition,
                          std::move(completion));
  return job;
}

// --- instance forms -----------------------------------------------------------------

void RVVisionOCR::startOcrImage(std::shared_ptr<Image> image, LanguageCodes languageCodes,
                                bool useFastTextRecognition, Completion completion) {
  // The image's pixels are taken on the worker, so that decoding a large file neither
  // blocks the caller nor runs outside the queue's limit.
  startJob(std::move(image), std::move(languageCodes), useFastTextRecognition,
           std::move(completion));
}

void RVVisionOCR::startOcrCGImage(std::shared_ptr<Bitmap> image, LanguageCodes languageCodes,
                                  bool useFastTextRecognition, Completion completion) {
  startJob(Image::initWithBitmap(std::move(image)), std::move(languageCodes),
           useFastTextRecognition, std::move(completion));
}

void RVVisionOCR::startOcrImageAtPath(const String& path, LanguageCodes languageCodes,
                                      bool useFastTextRecognition, Completion completion) {
  startOcrImage(Image::initByReferencingFile(toUTF8(path)), std::move(languageCodes),
                useFastTextRecognition, std::move(completion));
}

void RVVisionOCR::startOcrImageAtURL(const std::string& url, LanguageCodes languageCodes,
                                     bool useFastTextRecognition, Completion completion) {
  startOcrImage(Image::initByReferencingURL(url), std::move(languageCodes), useFastTextRecognition,
                std::move(completion));
}

void RVVisionOCR::startJob(std::shared_ptr<Image> image, LanguageCodes languageCodes,
                           bool useFastTextRecognition, Completion completion) {
  auto state = std::make_shared<JobState>();
  state->image = std::move(image);
  state_ = state;
  if (!recognitionAvailable()) {
    // Reported at once, on the caller's thread; nothing is queued.
    if (completion) completion(String(), unsupportedError());
    return;
  }
  completion_ = std::move(completion);
  layoutAnalyser_ = RVTextLayoutAnalyser::init();
  auto self = shared_from_this();
  ocrOperation_ = BlockOperation::blockOperationWithBlock(
      [self, state, languageCodes = std::move(languageCodes), useFastTextRecognition] {
        self->runJob(state, languageCodes, useFastTextRecognition);
      });
  ocrQueue()->addOperation(ocrOperation_);
}

// --- the work item ------------------------------------------------------------------

void RVVisionOCR::runJob(const std::shared_ptr<JobState>& state, const LanguageCodes& languageCodes,
                         bool useFastTextRecognition) {
  auto self = shared_from_this();
  auto request = TextRecognitionRequest::initWithCompletionHandler(
      [self, state](TextRecognitionRequest& finished, const std::optional<Error>& error) {
        String text;
        if (!error && self->readingOrder_ != RVReadingOrderLayoutAnalysis) {
          text = detail::orderedText(
              self->readingOrder_,
              finished.results().value_or(std::vector<RecognizedTextObservation>()), Size{},
              *self->layoutAnalyser_);
        } else if (!error) {
          self->addRecognitionBlocksToAnalyser(finished);
          Size size = state->image ? state->image->size() : Size{};
          self->layoutAnalyser_->analyse(size, kHorizontalWritingDirection);
          text = self->layoutAnalyser_->text();
        }
        MainQueue::async([self, state, text = std::move(text), error] {
          state->image.reset();
          if (self->completion_) self->completion_(text, error);
        });
      });
  detail::configureRequest(
      *request, languageCodes.empty() ? languageCodes : orderLanguageCodes(languageCodes),
      useFastTextRecognition, timeout_);
  request->setCancellationCheck([state] { return state->stopped.load(std::memory_order_relaxed); });
  auto handler = ImageRequestHandler::initWithImage(state->image, {});
  Error error;
  if (!handler->performRequests({request}, &error)) {
    state->error = error;
    logMessage(withObject(kErrorLogFormat, error.description()));
  }
}

void RVVisionOCR::addRecognitionBlocksToAnalyser(const TextRecognitionRequest& request) {
  if (!PlatformRegistry::platformVersion().isAtLeast(10, 15)) return;
  const auto& results = request.results();
  if (!results || results->empty() || !layoutAnalyser_) return;
  for (const auto& observation : *results) {
    for (const auto& candidate : observation.topCandidates(1)) {
      double confidence = static_cast<double>(candidate.confidence) * 100.0;
      layoutAnalyser_->addRecognitionBlock(RVRecognitionBlock::initWithText(
          candidate.string, observation.boundingBox, confidence, RVRecognitionBlockLevelLine));
    }
  }
}

// --- the queue and cancelling -------------------------------------------------------

std::shared_ptr<OperationQueue> RVVisionOCR::ocrQueue() {
  // Held by a pointer that is never released: the queue's workers live until exit.
  static std::shared_ptr<OperationQueue>* queue = [] {
    auto* made = new std::shared_ptr<OperationQueue>(OperationQueue::init());
    (*made)->setMaxConcurrentOperationCount(kMaxConcurrentJobs);
    sharedQueue.store(made->get());
    return made;
  }();
  return *queue;
}

void RVVisionOCR::cancelAllOCRJobs() {
  if (OperationQueue* queue = sharedQueue.load()) queue->cancelAllOperations();
}

void RVVisionOCR::cancelOCRJob() {
  if (ocrOperation_ && !ocrOperation_->isFinished() && !ocrOperation_->isCancelled()) {
    ocrOperation_->cancel();
  }
}

void RVVisionOCR::stopOCRJob() {
  if (state_) state_->stopped.store(true, std::memory_order_relaxed);
  cancelOCRJob();
}

}  // namespace corvel
