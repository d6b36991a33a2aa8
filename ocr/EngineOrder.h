// Internal: a page's text and block tree in the engine's own order of blocks and
// paragraphs, as the job's alternative to the layout analysis.
#pragma once

#include <vector>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/String.h"
#include "Corvelbase/platform/TextRecognizer.h"

namespace corvel::detail {

// One column-level block per engine block, holding a paragraph-level block per engine
// paragraph, holding the line-level blocks (best reading, confidence in percent). A
// container's text is its children's joined by "\n" (lines) or "\n\n" (paragraphs), its
// box their union and its confidence their mean.
RVBlockArray engineOrderColumns(const std::vector<RecognizedTextObservation>& observations);

// The same with rows kept together: engine blocks side by side whose lines pair up
// row by row, one of them holding short lines (a receipt's prices, a form's values, a
// table's columns, a transcript's line numbers), become one block whose lines are the
// rows, each read left to right. Blocks of long lines side by side (an article's
// columns) stay apart however their lines align.
RVBlockArray rowsOrderColumns(const std::vector<RecognizedTextObservation>& observations);

// The page's text: lines joined by "\n", paragraphs (and blocks) by "\n\n".
String engineOrderText(const RVBlockArray& columns);

}  // namespace corvel::detail
