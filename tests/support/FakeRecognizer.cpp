#include "support/FakeRecognizer.h"

#include <algorithm>

namespace corvel::testing {

bool FakeRecognizer::isAvailable() const {
  std::lock_guard lock(mutex_);
  return available_;
}

std::optional<std::vector<RecognizedTextObservation>> FakeRecognizer::recognize(
    const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) {
  std::unique_lock lock(mutex_);
  Recorded recorded{request.revision(),
                    request.usesLanguageCorrection(),
                    request.recognitionLevel(),
                    request.recognitionLanguages(),
                    request.automaticallyDetectsLanguage(),
                    request.timeout(),
                    bitmap.width(),
                    bitmap.height()};
  ++running_;
  maxRunning_ = std::max(maxRunning_, running_);
  changed_.notify_all();
  // A held recognition still stops when its request is cancelled, as an engine does
  // between words; the flag is another thread's, so it is polled.
  while (held_ && !request.isCancelled()) changed_.wait_for(lock, std::chrono::milliseconds(1));
  --running_;
  requests_.push_back(std::move(recorded));
  changed_.notify_all();
  if (request.isCancelled()) {
    *error = makeTextRecognitionError(TextRecognitionErrorCancelled, "cancelled");
    return std::nullopt;
  }
  for (const auto& code : request.recognitionLanguages()) {
    if (!supported_ ||
        std::find(supported_->begin(), supported_->end(), code) == supported_->end()) {
      *error =
          makeTextRecognitionError(TextRecognitionErrorUnsupportedLanguage,
                                   "the recognition language \"" + code + "\" is not supported");
      return std::nullopt;
    }
  }
  return observations_;
}

std::uint32_t FakeRecognizer::maxUsefulLongSide(const TextRecognitionRequest& request) const {
  std::lock_guard lock(mutex_);
  return request.recognitionLevel() == TextRecognitionLevelFast ? fastMaxLongSide_ : 0;
}

std::optional<std::vector<std::string>> FakeRecognizer::supportedRecognitionLanguages(
    std::int64_t level, std::int64_t revision, Error* error) {
  std::lock_guard lock(mutex_);
  supportedQueries_.push_back({level, revision});
  if (!supported_) *error = supportedError_;
  return supported_;
}

}  // namespace corvel::testing
