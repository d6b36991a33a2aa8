// Images of one format (CORVEL_FUZZ_FORMAT names it; the seeds are of that format, and
// mutations may wander into others). A decoded image has pixels within the budget, its
// RGBA has them all, and it reduces to fit.
#include "Corvelbase/platform/Image.h"
#include "FuzzSupport.h"

using namespace corvel;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  auto image = Image::initWithData(Data(data, data + size));
  if (image) {
    auto bitmap = image->bitmap();
    FUZZ_CHECK(bitmap);
    std::uint64_t width = bitmap->width(), height = bitmap->height();
    FUZZ_CHECK(width > 0 && height > 0 && width * height <= kMaxImagePixels);
    FUZZ_CHECK(bitmap->rgba().size() == width * height * 4);
    if (auto reduced = image->bitmapFittingLongSide(8))
      FUZZ_CHECK(reduced->width() <= 8 && reduced->height() <= 8);
  }
  return 0;
}
