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

  void setAvailable(bool available);
  void setObservations(std::vector<RecognizedTextObservation> observations);
  void setSupportedLanguages(std::optional<std::vector<std::string>> codes, Error error = {});
  // The long side the fake asks for fast requests (0, the default: full size).
  void setFastMaxLongSide(std::uint32_t side);

  // While held, recognitions wait inside `recognize` until `release`, or until their
  // request is cancelled (they then fail with TextRecognitionErrorCancelled).
  void hold();
  void release();
  // Waits until at least `count` recognitions are inside `recognize`; false on timeout.
  bool waitForRunning(std::size_t count, std::chrono::milliseconds timeout);
  // Waits until `count` recognitions have been made; false on timeout.
  bool waitForRecognitions(std::size_t count, std::chrono::milliseconds timeout);
  std::size_t running() const;
  std::size_t maxRunning() const;

  std::vector<Recorded> requests() const;
  std::vector<SupportedQuery> supportedQueries() const;

  bool isAvailable() const override;
  std::optional<std::vector<RecognizedTextObservation>> recognize(
      const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) override;
  std::uint32_t maxUsefulLongSide(const TextRecognitionRequest& request) const override;
  std::optional<std::vector<std::string>> supportedRecognitionLanguages(std::int64_t level,
                                                                        std::int64_t revision,
                                                                        Error* error) override;

 private:
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
