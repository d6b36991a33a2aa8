// Internal: what image jobs and document jobs do alike with one picture: the request's
// settings, and the text of its observations in the order the job asks for.
#pragma once

#include <string>
#include <vector>

#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::detail {

// Revision by platform version, language correction on, the level from the speed
// choice, `timeout`, and the languages: `orderedCodes` (already ordered), or with none
// automatic detection (platform 13 on) or "en-US".
void configureRequest(TextRecognitionRequest& request, const std::vector<std::string>& orderedCodes,
                      bool useFastTextRecognition, double timeout);

// The text of `observations` in `order`, leaving the block tree in `analyser`: the
// layout analysis of one line block per observation for a page of `size` pixels, or
// the engine's (or rows) order set as the analyser's columns and text.
String orderedText(RVReadingOrder order, const std::vector<RecognizedTextObservation>& observations,
                   Size size, RVTextLayoutAnalyser& analyser);

}  // namespace corvel::detail
