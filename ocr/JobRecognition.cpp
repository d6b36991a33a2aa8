#include "ocr/JobRecognition.h"

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/Platform.h"
#include "ocr/EngineOrder.h"

namespace corvel::detail {

namespace {
constexpr const char* kDefaultLanguage = "en-US";
constexpr std::int64_t kHorizontalWritingDirection = 0;
}  // namespace

void configureRequest(TextRecognitionRequest& request, const std::vector<std::string>& orderedCodes,
                      bool useFastTextRecognition, double timeout) {
  PlatformVersion version = PlatformRegistry::platformVersion();
  if (version.isAtLeast(13)) {
    request.setRevision(3);
  } else if (version.isAtLeast(11)) {
    request.setRevision(2);
  }
  request.setUsesLanguageCorrection(true);
  request.setTimeout(timeout);
  request.setRecognitionLevel(useFastTextRecognition ? TextRecognitionLevelFast
                                                     : TextRecognitionLevelAccurate);
  if (!orderedCodes.empty()) {
    request.setRecognitionLanguages(orderedCodes);
  } else if (version.isAtLeast(13)) {
    request.setAutomaticallyDetectsLanguage(true);
  } else {
    request.setRecognitionLanguages({kDefaultLanguage});
  }
}

String orderedText(RVReadingOrder order, const std::vector<RecognizedTextObservation>& observations,
                   Size size, RVTextLayoutAnalyser& analyser) {
  if (order == RVReadingOrderLayoutAnalysis) {
    for (const auto& observation : observations) {
      for (const auto& candidate : observation.topCandidates(1)) {
        analyser.addRecognitionBlock(RVRecognitionBlock::initWithText(
            candidate.string, observation.boundingBox,
            static_cast<double>(candidate.confidence) * 100.0, RVRecognitionBlockLevelLine));
      }
    }
    analyser.analyse(size, kHorizontalWritingDirection);
    return analyser.text();
  }
  auto columns = order == RVReadingOrderRows ? rowsOrderColumns(observations)
                                             : engineOrderColumns(observations);
  String text = engineOrderText(columns);
  analyser.setColumnBlocks(std::make_shared<RVBlockArray>(std::move(columns)));
  analyser.setOrderedText(text);
  return text;
}

}  // namespace corvel::detail
