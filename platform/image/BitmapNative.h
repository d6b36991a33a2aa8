// Internal: what a Bitmap holds, for the platform layer's backends (never installed).
#pragma once

#include <leptonica/allheaders.h>

#include "Corvelbase/platform/Image.h"

namespace corvel {

struct Bitmap::Native {
  // Owned; 1, 8 or 32 bits per pixel, never colour-mapped (decoding normalises).
  PIX* pix = nullptr;

  explicit Native(PIX* p) : pix(p) {}
  ~Native() {
    if (pix) pixDestroy(&pix);
  }
  Native(const Native&) = delete;
  Native& operator=(const Native&) = delete;
};

// Takes ownership of `pix` and normalises it to 1, 8 or 32 bits per pixel without a
// colour map; nullptr (and `pix` freed) when that fails or the size is out of budget.
std::shared_ptr<Bitmap> bitmapFromPix(PIX* pix, std::string* failure);

// Decodes a PNG file's bytes; nullptr with *failure saying why when they are not one
// whole PNG image within the pixel budget.
PIX* decodePNG(const std::uint8_t* bytes, std::size_t size, std::string* failure);

}  // namespace corvel
