// Images of one format (CORVEL_FUZZ_FORMAT names it; the seeds are of that format, and
// mutations may wander into others). A decoded image has pixels within the budget, its
// RGBA has them all, and it reduces to fit; for PNG, the libdeflate path and libpng give
// the same pixels, whole and reduced.
#include <string_view>

#include "FuzzSupport.h"
#include "platform/image/BitmapNative.h"

using namespace corvel;

namespace {

void checkPathsAgree(const std::uint8_t* data, std::size_t size, std::uint32_t maxLongSide) {
  PIX* quick = decodePNGWhole(data, size, maxLongSide);
  if (!quick) return;
  std::string why;
  PIX* careful = decodePNGWithLibpng(data, size, maxLongSide, &why);
  FUZZ_CHECK(careful);
  l_int32 same = 0;
  pixEqual(quick, careful, &same);
  FUZZ_CHECK(same);
  pixDestroy(&quick);
  pixDestroy(&careful);
}

}  // namespace

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
  if (std::string_view(CORVEL_FUZZ_FORMAT) == "png") {
    checkPathsAgree(data, size, 0);
    checkPathsAgree(data, size, 7);
  }
  return 0;
}
