// One recognition request performed through an image handler, as the jobs perform them:
// shared by the recogniser suites.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::testing {

struct Outcome {
  std::optional<std::vector<RecognizedTextObservation>> results;
  std::optional<Error> error;
  int handlerCalls = 0;

  // The best reading of each line, a line each.
  std::string text() const {
    std::string out;
    if (results)
      for (const auto& o : *results) out += toUTF8(o.candidates.at(0).string) + "\n";
    return out;
  }
};

// Performs one request on `handler` with the registered recogniser; `configure` may set
// more of the request. What the handler returns must agree with what the completion got.
inline Outcome perform(const std::shared_ptr<ImageRequestHandler>& handler, std::int64_t level,
                       std::vector<std::string> languages, bool detect = false,
                       const std::function<void(TextRecognitionRequest&)>& configure = {}) {
  Outcome outcome;
  auto request = TextRecognitionRequest::initWithCompletionHandler(
      [&](TextRecognitionRequest& r, const std::optional<Error>& error) {
        ++outcome.handlerCalls;
        outcome.results = r.results();
        outcome.error = error;
      });
  request->setRecognitionLevel(level);
  request->setRecognitionLanguages(std::move(languages));
  request->setAutomaticallyDetectsLanguage(detect);
  if (configure) configure(*request);
  Error error;
  bool ok = handler->performRequests({request}, &error);
  EXPECT_EQ(ok, !outcome.error.has_value());
  if (outcome.error) {
    EXPECT_EQ(error, *outcome.error);
  }
  return outcome;
}

}  // namespace corvel::testing
