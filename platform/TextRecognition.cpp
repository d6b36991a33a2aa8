// Requests and the image request handler. The recogniser behind them is the registry's;
// the engine itself lives in platform/tesseract/.
#include <algorithm>

#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel {

const char* const TextRecognitionErrorDomain = "com.corvelworks.textrecognition";
const char* const TextRecognitionErrorReasonKey = "Error reason";

Error makeTextRecognitionError(std::int64_t code, const std::string& reason) {
  Error error;
  error.domain = TextRecognitionErrorDomain;
  error.code = code;
  error.userInfo[TextRecognitionErrorReasonKey] = PropertyList(fromUTF8(reason));
  return error;
}

std::vector<RecognizedText> RecognizedTextObservation::topCandidates(
    std::size_t maxCandidateCount) const {
  std::size_t count = std::min(maxCandidateCount, candidates.size());
  return {candidates.begin(), candidates.begin() + static_cast<std::ptrdiff_t>(count)};
}

TextRecognizer::~TextRecognizer() = default;

// --- requests -----------------------------------------------------------------------

std::shared_ptr<TextRecognitionRequest> TextRecognitionRequest::init() {
  return std::shared_ptr<TextRecognitionRequest>(new TextRecognitionRequest);
}

std::shared_ptr<TextRecognitionRequest> TextRecognitionRequest::initWithCompletionHandler(
    CompletionHandler handler) {
  auto request = init();
  request->handler_ = std::move(handler);
  return request;
}

std::optional<std::vector<std::string>> TextRecognitionRequest::supportedRecognitionLanguages(
    Error* error) const {
  return supportedRecognitionLanguagesForTextRecognitionLevel(recognitionLevel_,
                                                              revision_.value_or(0), error);
}

std::optional<std::vector<std::string>>
TextRecognitionRequest::supportedRecognitionLanguagesForTextRecognitionLevel(std::int64_t level,
                                                                             std::int64_t revision,
                                                                             Error* error) {
  Error failure;
  std::optional<std::vector<std::string>> codes;
  auto recognizer = PlatformRegistry::textRecognizer();
  if (!recognizer || !recognizer->isAvailable()) {
    failure = makeTextRecognitionError(TextRecognitionErrorNoRecognizer,
                                       "no text recogniser is available");
  } else {
    codes = recognizer->supportedRecognitionLanguages(level, revision, &failure);
  }
  if (!codes && error) *error = failure;
  return codes;
}

// --- the image request handler --------------------------------------------------------

std::shared_ptr<ImageRequestHandler> ImageRequestHandler::initWithCGImage(
    std::shared_ptr<Bitmap> image, PropertyList::Dictionary /*options*/) {
  std::shared_ptr<ImageRequestHandler> handler(new ImageRequestHandler);
  handler->bitmap_ = std::move(image);
  return handler;
}

std::shared_ptr<ImageRequestHandler> ImageRequestHandler::initWithImage(
    std::shared_ptr<Image> image, PropertyList::Dictionary /*options*/) {
  std::shared_ptr<ImageRequestHandler> handler(new ImageRequestHandler);
  handler->image_ = std::move(image);
  return handler;
}

bool ImageRequestHandler::performRequests(
    const std::vector<std::shared_ptr<TextRecognitionRequest>>& requests, Error* error) {
  std::optional<Error> firstFailure;
  std::shared_ptr<Bitmap> bitmap = bitmap_;
  std::string unreadable = "no image was given";
  auto recognizer = PlatformRegistry::textRecognizer();
  if (!bitmap && image_) {
    // The largest size any of the requests can use, so that a large picture is reduced
    // while it is decoded rather than decoded whole and then reduced.
    std::uint32_t longSide = 0;
    for (const auto& request : requests) {
      std::uint32_t useful = request && recognizer ? recognizer->maxUsefulLongSide(*request) : 0;
      if (useful == 0) {
        longSide = 0;
        break;
      }
      longSide = std::max(longSide, useful);
    }
    bitmap = image_->bitmapFittingLongSide(longSide);
    if (!bitmap) unreadable = image_->failureReason();
  }
  for (const auto& request : requests) {
    if (!request) continue;
    Error failure;
    std::optional<std::vector<RecognizedTextObservation>> results;
    if (!bitmap) {
      failure = makeTextRecognitionError(TextRecognitionErrorImageUnreadable, unreadable);
    } else if (!recognizer || !recognizer->isAvailable()) {
      failure = makeTextRecognitionError(TextRecognitionErrorNoRecognizer,
                                         "no text recogniser is available");
    } else {
      results = recognizer->recognize(*request, *bitmap, &failure);
    }
    request->setResults(std::move(results));
    std::optional<Error> reported;
    if (!request->results()) {
      reported = failure;
      if (!firstFailure) firstFailure = failure;
    }
    if (request->completionHandler()) request->completionHandler()(*request, reported);
  }
  if (firstFailure && error) *error = *firstFailure;
  return !firstFailure;
}

}  // namespace corvel
