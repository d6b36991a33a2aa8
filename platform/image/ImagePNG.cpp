// PNG encoding of bitmaps, for pictures the library draws (the OCR overlay).
#include "platform/image/BitmapNative.h"

namespace corvel {

std::optional<Data> pngDataForBitmap(const Bitmap& bitmap) {
  l_uint8* bytes = nullptr;
  size_t size = 0;
  if (pixWriteMemPng(&bytes, &size, bitmap.native().pix, 0.0f) != 0 || !bytes) {
    if (bytes) lept_free(bytes);
    return std::nullopt;
  }
  Data out(bytes, bytes + size);
  lept_free(bytes);
  return out;
}

}  // namespace corvel
