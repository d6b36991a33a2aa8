// The overlay picture of `corvel ocr --overlay`: a page with its columns, paragraphs and
// lines drawn over it, the paragraphs numbered in reading order, and a legend.
#pragma once

#include <string>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/Image.h"

namespace corvel::tool {

// Draws `columns` over `page` into the PNG file `out`; an error message, or "" on success.
std::string writeOverlay(const Bitmap& page, const RVBlockArray& columns, const std::string& out);

}  // namespace corvel::tool
