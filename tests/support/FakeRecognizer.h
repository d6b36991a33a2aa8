// A scripted text recogniser for tests: it records every request it gets, answers with
// the observations it was given, refuses codes outside its supported languages as the
// engine does, and can hold recognitions until the test lets them go, counting how many
// run at once. A failure is injected by wrapping it (support/ForwardingRecognizer.h).
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::testing {

class FakeRecognizer final : public TextRecognizer {
 public:
  // The settings of one request as the recogniser saw them, and the image's size.
  struct Recorded {
    std::optional<std::int64_t> revision;
    bool usesLanguageCorrection = false;
    std::int64_t recognitionLevel = -1;
    std::vector<std::string> languages;
    bool automaticallyDetectsLanguage = false;
    double timeout = 0;
    std::uint32_t width = 0;
    std::uint32_t height = 0;
  };
  struct SupportedQuery {
    std::int64_t level;
    std::int64_t revision;
  };

  void setAvailable(bool available) {
    locked([&] { available_ = available; });
  }
  void setObservations(std::vector<RecognizedTextObservation> observations) {
    locked([&] { observations_ = std::move(observations); });
  }
  void setSupportedLanguages(std::optional<std::vector<std::string>> codes, Error error = {}) {
    locked([&] { supported_ = std::move(codes), supportedError_ = std::move(error); });
  }
  // The long side the fake asks for fast requests (0, the default: full size).
  void setFastMaxLongSide(std::uint32_t side) {
    locked([&] { fastMaxLongSide_ = side; });
  }

  // While held, recognitions wait inside `recognize` until `release`, or until their
  // request is cancelled (they then fail with TextRecognitionErrorCancelled).
  void hold() {
    locked([&] { held_ = true; });
  }
  void release() {
    locked([&] { held_ = false; });
    changed_.notify_all();
  }
  // Wait until at least `count` recognitions are inside `recognize`, or have been made;
  // false on timeout.
  bool waitForRunning(std::size_t count, std::chrono::milliseconds timeout) {
    return waitUntil(timeout, [&] { return running_ >= count; });
  }
  bool waitForRecognitions(std::size_t count, std::chrono::milliseconds timeout) {
    return waitUntil(timeout, [&] { return requests_.size() >= count; });
  }
  std::size_t running() const {
    return locked([&] { return running_; });
  }
  std::size_t maxRunning() const {
    return locked([&] { return maxRunning_; });
  }
  std::vector<Recorded> requests() const {
    return locked([&] { return requests_; });
  }
  std::vector<SupportedQuery> supportedQueries() const {
    return locked([&] { return supportedQueries_; });
  }

  bool isAvailable() const override;
  std::optional<std::vector<RecognizedTextObservation>> recognize(
      const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) override;
  std::uint32_t maxUsefulLongSide(const TextRecognitionRequest& request) const override;
  std::optional<std::vector<std::string>> supportedRecognitionLanguages(std::int64_t level,
                                                                        std::int64_t revision,
                                                                        Error* error) override;

 private:
  template <class F>
  auto locked(F f) const -> decltype(f()) {
    std::lock_guard lock(mutex_);
    return f();
  }
  template <class P>
  bool waitUntil(std::chrono::milliseconds timeout, P ready) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, timeout, ready);
  }
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  bool available_ = true;
  bool held_ = false;
  std::size_t running_ = 0;
  std::size_t maxRunning_ = 0;
  std::vector<RecognizedTextObservation> observations_;
  std::optional<std::vector<std::string>> supported_ = std::vector<std::string>{"en-US"};
  std::uint32_t fastMaxLongSide_ = 0;
  Error supportedError_;
  std::vector<Recorded> requests_;
  std::vector<SupportedQuery> supportedQueries_;
};

}  // namespace corvel::testing
