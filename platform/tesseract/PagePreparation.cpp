#include "platform/tesseract/PagePreparation.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <vector>

#include "platform/image/BitmapNative.h"

namespace corvel::detail {

namespace {

// The working copy's long side: an A4 page at 300 dpi is seen at a quarter of its size,
// where body text is still 5 pixels high. A page with more components too small to be
// characters than characters has smaller text: it is measured again at twice the size.
constexpr std::uint32_t kWorkingLongSide = 1300;
// The engine's Sauvola settings: a window a third of an inch wide and its k factor.
constexpr double kSauvolaWindowInches = 0.33;
constexpr float kSauvolaFactor = 0.34f;
constexpr int kAssumedResolution = 300;
// Character-like components, in pixels of the working copy.
constexpr int kMinCharacterHeight = 4, kMaxCharacterHeight = 120;
constexpr int kMaxCharacterAspect = 3;  // width over height
// Components this high but below a character's are characters seen too small.
constexpr int kMinSmallHeight = 2;
// The resolution at which the median character is a 10-point face's: its median
// component (mostly x-height letters) is about 5 points high.
constexpr double kResolutionPerTextPixel = 72.0 / 5.0;
// A stated resolution is believed within this factor of the one the text suggests.
constexpr double kResolutionTolerance = 2.0;
constexpr int kMinResolution = 70, kMaxResolution = 2400;
constexpr double kMaxEnlargement = 4.0;
// Sauvola is chosen when it finds this many more characters than Otsu ...
constexpr double kSauvolaGain = 1.2;
constexpr int kSauvolaMargin = 10;
// ... and its components stay within this multiple of Otsu's: past it they are specks
// of a textured background, not text.
constexpr int kMaxSpeckleFactor = 3;
constexpr int kMinComponentsForSpeckle = 100;
// A page has light text on a dark ground when Otsu finds this many light characters,
// and at least a quarter of all it finds.
constexpr int kMinLightCharacters = 20;
constexpr double kMinLightShare = 0.15;
// A sheet on a surround covers this share of the picture, and leaves at most this many
// characters outside.
constexpr double kMinSheetShare = 0.35, kMaxSheetShare = 0.95;
constexpr int kMaxCharactersOutsideSheet = 2;
// Ink covers less than this share of a page that is evenly lit.
constexpr double kMinDarkShareForSauvola = 0.2;
// Character components wider than high by this much lie on their side.
constexpr double kSidewaysAspect = 1.2;

struct PixDeleter {
  void operator()(PIX* pix) const { pixDestroy(&pix); }
};
using PixPtr = std::unique_ptr<PIX, PixDeleter>;
struct BoxaDeleter {
  void operator()(BOXA* boxa) const { boxaDestroy(&boxa); }
};
struct NumaDeleter {
  void operator()(NUMA* numa) const { numaDestroy(&numa); }
};

// An 8-bit grey copy of `page` reduced by `*reduction` (a power of two) so that its
// long side is at most `maxLongSide`.
PixPtr workingGrey(PIX* page, std::uint32_t maxLongSide, int* reduction) {
  std::uint32_t longSide =
      static_cast<std::uint32_t>(std::max(pixGetWidth(page), pixGetHeight(page)));
  int r = 1;
  while (longSide / static_cast<std::uint32_t>(r) > maxLongSide && r < 16) r *= 2;
  *reduction = r;
  int depth = pixGetDepth(page);
  if (depth == 1) {
    return PixPtr(r == 1 ? pixConvert1To8(nullptr, page, 255, 0)
                         : pixScaleToGray(page, 1.0f / static_cast<float>(r)));
  }
  PixPtr reduced(pixClone(page));
  for (int step = r; step > 1 && reduced; step /= 2) reduced.reset(pixScaleAreaMap2(reduced.get()));
  if (!reduced) return nullptr;
  if (depth == 32) return PixPtr(pixConvertRGBToLuminance(reduced.get()));
  return reduced;
}

struct Component {
  l_int32 x, y, w, h;
  bool light;
};

// The character-like components of `binary` (light ones: of its inverse) that do not
// touch the picture's edge: the page's own edge, a dark desk around a photographed
// sheet, the ground around inverted text are not text. Counts every such component.
void collectComponents(PIX* binary, bool light, Binarisation* counts, std::vector<Component>* out) {
  std::unique_ptr<BOXA, BoxaDeleter> boxes(pixConnCompBB(binary, 8));
  if (!boxes) return;
  int width = pixGetWidth(binary), height = pixGetHeight(binary);
  int count = boxaGetCount(boxes.get());
  for (int i = 0; i < count; ++i) {
    Component c{0, 0, 0, 0, light};
    boxaGetBoxGeometry(boxes.get(), i, &c.x, &c.y, &c.w, &c.h);
    if (c.x == 0 || c.y == 0 || c.x + c.w >= width || c.y + c.h >= height) continue;
    ++counts->components;
    if (c.h >= kMinSmallHeight && c.h < kMinCharacterHeight) ++counts->tooSmall;
    if (c.h >= kMinCharacterHeight && c.h <= kMaxCharacterHeight &&
        c.w <= kMaxCharacterAspect * c.h) {
      out->push_back(c);
    }
  }
}

template <typename T>
T median(std::vector<T> values) {
  if (values.empty()) return T{};
  auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

// The largest light component of `inverse` when it may be a sheet lying on a darker
// surround (a photographed page on a desk): most of the picture, not all of it.
// Coordinates of the working copy; an empty box otherwise.
Component findSheet(PIX* inverse) {
  Component none{0, 0, 0, 0, true};
  std::unique_ptr<BOXA, BoxaDeleter> boxes(pixConnCompBB(inverse, 8));
  if (!boxes) return none;
  Component sheet = none;
  double largest = 0;
  for (int i = 0; i < boxaGetCount(boxes.get()); ++i) {
    Component c{0, 0, 0, 0, true};
    boxaGetBoxGeometry(boxes.get(), i, &c.x, &c.y, &c.w, &c.h);
    if (double area = static_cast<double>(c.w) * c.h; area > largest) {
      largest = area;
      sheet = c;
    }
  }
  int width = pixGetWidth(inverse), height = pixGetHeight(inverse);
  double share = largest / (static_cast<double>(width) * height);
  return share < kMinSheetShare || share > kMaxSheetShare ? none : sheet;
}

int countOutside(const Component& sheet, const std::vector<Component>& characters) {
  int outside = 0;
  for (const auto& c : characters) {
    int cx = c.x + c.w / 2, cy = c.y + c.h / 2;
    if (cx < sheet.x || cy < sheet.y || cx >= sheet.x + sheet.w || cy >= sheet.y + sheet.h) {
      ++outside;
    }
  }
  return outside;
}

// The light components not inside a dark one: letters rather than the counters of
// dark letters (the holes of "o" and "e").
std::vector<Component> lightLetters(std::vector<Component> dark,
                                    const std::vector<Component>& light) {
  std::sort(dark.begin(), dark.end(),
            [](const Component& a, const Component& b) { return a.x < b.x; });
  int widest = 0;
  for (const auto& d : dark) widest = std::max(widest, d.w);
  std::vector<Component> letters;
  for (const auto& l : light) {
    // Dark components starting at most `widest` to the left are the only ones that can
    // hold this one.
    auto first = std::lower_bound(dark.begin(), dark.end(), l.x - widest,
                                  [](const Component& d, int x) { return d.x < x; });
    bool inside = false;
    for (auto it = first; it != dark.end() && it->x <= l.x && !inside; ++it) {
      inside = it->x + it->w >= l.x + l.w && it->y <= l.y && it->y + it->h >= l.y + l.h;
    }
    if (!inside) letters.push_back(l);
  }
  return letters;
}

// Counts the components of both polarities (a dark slide's light letters are holes in
// its dark background) and, for Otsu, looks for a sheet on a surround.
Binarisation describe(PIX* binary, int reduction, Component* sheet, std::vector<Component>* found) {
  Binarisation result;
  if (!binary) return result;
  std::vector<Component> dark, light;
  collectComponents(binary, false, &result, &dark);
  PixPtr inverse(pixInvert(nullptr, binary));
  if (!inverse) return result;
  collectComponents(inverse.get(), true, &result, &light);
  std::vector<Component> letters = lightLetters(dark, light);
  result.lightCharacters = static_cast<int>(letters.size());
  std::vector<Component> characters = std::move(dark);
  characters.insert(characters.end(), letters.begin(), letters.end());
  std::vector<int> heights;
  std::vector<double> aspects;
  for (const auto& c : characters) {
    heights.push_back(c.h * reduction);
    aspects.push_back(static_cast<double>(c.w) / c.h);
    result.boxes.push_back({c.x * reduction, c.y * reduction, c.w * reduction, c.h * reduction});
  }
  result.characters = static_cast<int>(characters.size());
  result.medianHeight = median(heights);
  result.medianAspect = median(aspects);
  if (sheet) *sheet = findSheet(inverse.get());
  *found = std::move(characters);
  return result;
}

PixPtr otsuBinary(PIX* grey) {
  // Every other pixel of every other row is plenty for a histogram.
  std::unique_ptr<NUMA, NumaDeleter> histogram(pixGetGrayHistogram(grey, 2));
  l_int32 split = 0;
  if (!histogram || numaSplitDistribution(histogram.get(), 0.0f, &split, nullptr, nullptr, nullptr,
                                          nullptr, nullptr) != 0) {
    return nullptr;
  }
  return PixPtr(pixThresholdToBinary(grey, split + 1));
}

PixPtr sauvolaBinary(PIX* grey, int reduction) {
  int half =
      static_cast<int>(std::lround(kSauvolaWindowInches * kAssumedResolution / 2 / reduction));
  half = std::min(half, (std::min(pixGetWidth(grey), pixGetHeight(grey)) - 3) / 2);
  if (half < 2) return nullptr;
  PIX* binary = nullptr;
  if (pixSauvolaBinarize(grey, half, kSauvolaFactor, 1, nullptr, nullptr, nullptr, &binary) != 0) {
    return nullptr;
  }
  return PixPtr(binary);
}

bool plausibleResolution(int resolution) {
  return resolution >= kMinResolution && resolution <= kMaxResolution;
}

}  // namespace

namespace {

PageMeasures measureAt(PIX* page, std::uint32_t maxLongSide, int* reduction) {
  PageMeasures measures;
  measures.width = static_cast<std::uint32_t>(pixGetWidth(page));
  measures.height = static_cast<std::uint32_t>(pixGetHeight(page));
  PixPtr grey = workingGrey(page, maxLongSide, reduction);
  if (!grey) return measures;
  int r = *reduction;
  Component sheet{0, 0, 0, 0, true};
  std::vector<Component> otsuCharacters, sauvolaCharacters;
  PixPtr otsu = otsuBinary(grey.get());
  measures.otsu = describe(otsu.get(), r, &sheet, &otsuCharacters);
  // Where Otsu leaves the page mostly light, no shadow or dark ground hides text from
  // it, and an adaptive threshold could only match it: Sauvola is measured only where
  // Otsu turns a large share of the page dark.
  l_int32 dark = 0;
  if (otsu) pixCountPixels(otsu.get(), &dark, nullptr);
  double darkShare = static_cast<double>(dark) /
                     (static_cast<double>(pixGetWidth(grey.get())) * pixGetHeight(grey.get()));
  measures.unevenlyLit = darkShare >= kMinDarkShareForSauvola;
  if (measures.unevenlyLit) {
    measures.sauvola = describe(sauvolaBinary(grey.get(), r).get(), r, nullptr, &sauvolaCharacters);
  } else {
    measures.sauvola = measures.otsu;
  }
  // No text of either binarisation may lie outside the sheet (Otsu alone misses the
  // text in a shadow, which a sheet found in the lit part would cut off). Sauvola's
  // specks on a textured ground do not count as text.
  bool speckled = measures.sauvola.characters * 2 < measures.sauvola.components;
  if (sheet.w > 0 &&
      (countOutside(sheet, otsuCharacters) > kMaxCharactersOutsideSheet ||
       (!speckled && countOutside(sheet, sauvolaCharacters) > kMaxCharactersOutsideSheet))) {
    sheet.w = 0;
  }
  if (sheet.w > 0) measures.sheet = {sheet.x * r, sheet.y * r, sheet.w * r, sheet.h * r};
  return measures;
}

}  // namespace

PageMeasures measurePage(PIX* page) {
  int reduction = 1;
  PageMeasures measures = measureAt(page, kWorkingLongSide, &reduction);
  if (reduction > 1 && measures.otsu.tooSmall > measures.otsu.characters) {
    measures = measureAt(page, kWorkingLongSide * 2, &reduction);
  }
  return measures;
}

PagePlan planPage(const PageMeasures& measures, int fileResolution, const PlanLimits& limits) {
  const Binarisation& otsu = measures.otsu;
  const Binarisation& sauvola = measures.sauvola;
  PagePlan plan;
  bool speckled = sauvola.components >
                      kMaxSpeckleFactor * std::max(otsu.components, kMinComponentsForSpeckle) &&
                  sauvola.characters * 2 < sauvola.components;
  // Sauvola sees only dark ink: light letters on a dark ground vanish under it.
  bool lightText = otsu.lightCharacters >= kMinLightCharacters &&
                   otsu.lightCharacters >= kMinLightShare * otsu.characters;
  plan.lightText = otsu.lightCharacters >= kMinLightCharacters;
  bool sauvolaReadsMore = sauvola.characters >= kSauvolaGain * otsu.characters + kSauvolaMargin;
  bool sauvolaSafe = !lightText && !speckled;
  plan.threshold = sauvolaSafe && sauvolaReadsMore ? Threshold::Sauvola : Threshold::Otsu;
  // Otsu, the engine's default, is always safe to fall back on; Sauvola only where it
  // neither loses light text nor turns the background into specks, and where the light
  // may vary: on an evenly lit scan both read alike, and a poor reading (a typeface the
  // models do not know) is not the binarisation's fault. A photographed sheet is lit
  // unevenly even where Otsu keeps most of it light.
  plan.alternativeWorthTrying = plan.threshold == Threshold::Sauvola ||
                                (sauvolaSafe && (measures.unevenlyLit || measures.sheet.w > 0));
  const Binarisation& chosen = plan.threshold == Threshold::Sauvola ? sauvola : otsu;
  plan.characters = chosen.characters;
  plan.characterBoxes = chosen.boxes;
  plan.sideways = chosen.medianAspect > kSidewaysAspect;
  // Lying on their side, characters are as high as they are wide upright.
  plan.textHeight = chosen.medianHeight * (plan.sideways ? chosen.medianAspect : 1.0);
  plan.crop = measures.sheet;

  double resolution = plausibleResolution(fileResolution) ? fileResolution : 0;
  if (plan.textHeight > 0) {
    double suggested = kResolutionPerTextPixel * plan.textHeight;
    if (resolution <= 0 || resolution > suggested * kResolutionTolerance ||
        resolution * kResolutionTolerance < suggested) {
      resolution = suggested;
    }
    if (plan.textHeight < limits.enlargeBelow) {
      plan.scale = std::min(limits.enlargeTo / plan.textHeight, kMaxEnlargement);
    } else if (limits.maxTextHeight > 0 && plan.textHeight > limits.maxTextHeight) {
      plan.scale = limits.maxTextHeight / plan.textHeight;
    }
  }
  double longSide = std::max(measures.width, measures.height);
  if (limits.maxLongSide > 0 && longSide * plan.scale > limits.maxLongSide) {
    plan.scale = std::min(1.0, limits.maxLongSide / longSide);
  }
  if (resolution > 0) {
    plan.resolution = std::clamp(static_cast<int>(std::lround(resolution * plan.scale)),
                                 kMinResolution, kMaxResolution);
  }
  return plan;
}

PIX* cropPage(PIX* page, const PageBox& box) {
  BOX* region = boxCreate(box.x, box.y, box.w, box.h);
  if (!region) return nullptr;
  PIX* cropped = pixClipRectangle(page, region, nullptr);
  boxDestroy(&region);
  return cropped;
}

PIX* scalePage(PIX* page, double scale) {
  if (scale < 1) {
    auto longSide = static_cast<double>(std::max(pixGetWidth(page), pixGetHeight(page)));
    return reducePix(page, static_cast<std::uint32_t>(std::max(1.0, std::floor(longSide * scale))));
  }
  PixPtr source(pixGetDepth(page) == 1 ? pixConvert1To8(nullptr, page, 255, 0) : pixClone(page));
  if (!source) return nullptr;
  auto factor = static_cast<l_float32>(scale);
  return pixScaleLI(source.get(), factor, factor);
}

}  // namespace corvel::detail
