// A recogniser that hands every call to the one it wraps. A test derives from it and
// overrides only the call it wants to fail, slow down or count, around the scripted fake
// or the real engine alike.
#pragma once

#include <memory>
#include <utility>

#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::testing {

class ForwardingRecognizer : public TextRecognizer {
 public:
  explicit ForwardingRecognizer(std::shared_ptr<TextRecognizer> target)
      : target_(std::move(target)) {}

  bool isAvailable() const override { return target_->isAvailable(); }
  std::optional<std::vector<RecognizedTextObservation>> recognize(
      const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) override {
    return target_->recognize(request, bitmap, error);
  }
  std::uint32_t maxUsefulLongSide(const TextRecognitionRequest& request) const override {
    return target_->maxUsefulLongSide(request);
  }
  std::optional<std::vector<std::string>> supportedRecognitionLanguages(std::int64_t level,
                                                                        std::int64_t revision,
                                                                        Error* error) override {
    return target_->supportedRecognitionLanguages(level, revision, error);
  }

  TextRecognizer& target() const { return *target_; }

 private:
  std::shared_ptr<TextRecognizer> target_;
};

}  // namespace corvel::testing
