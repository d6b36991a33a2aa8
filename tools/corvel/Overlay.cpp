#include "tools/corvel/Overlay.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <map>

#include "Corvelbase/platform/Files.h"

namespace corvel::tool {

namespace {

struct Colour {
  std::uint8_t r, g, b;
};
const Colour kLevelColours[] = {{30, 90, 230}, {20, 160, 60}, {220, 40, 40}};
const Colour kInk{0, 0, 0}, kPaper{255, 255, 255};

// A 5 x 7 pixel font for the digits and the letters of the legend: each glyph is seven
// rows of five cells, '#' inked.
const std::map<char, const char*>& glyphs() {
  static const std::map<char, const char*> table = {{'0', " ### #   ##  ### # ###  ##   # ### "},
                                                    {'1', "  #   ##    #    #    #    #   ### "},
                                                    {'2', " ### #   #    #   #   #   #   #####"},
                                                    {'3', "#####   #   #     #     ##   # ### "},
                                                    {'4', "   #   ##  # # #  # #####   #    # "},
                                                    {'5', "######    ####     #    ##   # ### "},
                                                    {'6', "  ##  #   #    #### #   ##   # ### "},
                                                    {'7', "#####    #   #   #   #    #    #   "},
                                                    {'8', " ### #   ##   # ### #   ##   # ### "},
                                                    {'9', " ### #   ##   # ####    #   #  ##  "},
                                                    {'a', "           ###     # #####   # ####"},
                                                    {'c', "           ### #    #    #   # ### "},
                                                    {'d', "    #    # ## ##  ###   ##   # ####"},
                                                    {'e', "           ### #   #######     ### "},
                                                    {'g', "      #####   ##   # ####    # ### "},
                                                    {'h', "#    #    # ## ##  ##   ##   ##   #"},
                                                    {'i', "  #        ##    #    #    #   ### "},
                                                    {'l', " ##    #    #    #    #    #   ### "},
                                                    {'m', "          ## # # # ## # ##   ##   #"},
                                                    {'n', "          # ## ##  ##   ##   ##   #"},
                                                    {'o', "           ### #   ##   ##   # ### "},
                                                    {'p', "          #### #   ##### #    #    "},
                                                    {'r', "          # ## ##  ##    #    #    "},
                                                    {'s', "           #####     ###     ##### "},
                                                    {'u', "          #   ##   ##   ##  ## ## #"},
                                                    {'=', "          #####     #####          "},
                                                    {' ', ""}};
  return table;
}

class Canvas {
 public:
  Canvas(std::uint32_t width, std::uint32_t height, Data rgba)
      : width_(width), height_(height), rgba_(std::move(rgba)) {}

  void plot(long x, long y, Colour c) {
    if (x < 0 || y < 0 || x >= static_cast<long>(width_) || y >= static_cast<long>(height_)) return;
    std::uint8_t* p =
        &rgba_[(static_cast<std::size_t>(y) * width_ + static_cast<std::size_t>(x)) * 4];
    p[0] = c.r, p[1] = c.g, p[2] = c.b, p[3] = 255;
  }
  void fill(long left, long top, long w, long h, Colour c) {
    for (long y = top; y < top + h; ++y)
      for (long x = left; x < left + w; ++x) plot(x, y, c);
  }
  void stroke(long left, long top, long right, long bottom, Colour c, int thickness) {
    for (int t = 0; t < thickness; ++t) {
      for (long x = left - t; x <= right + t; ++x) plot(x, top - t, c), plot(x, bottom + t, c);
      for (long y = top - t; y <= bottom + t; ++y) plot(left - t, y, c), plot(right + t, y, c);
    }
  }
  // Writes `text` with its top left at (x, y), each font cell `scale` pixels; returns
  // the width written.
  long text(long x, long y, const std::string& text, Colour c, int scale) {
    long start = x;
    for (char ch : text) {
      auto it = glyphs().find(ch);
      const char* cells = it == glyphs().end() ? "" : it->second;
      std::size_t count = std::strlen(cells);
      for (std::size_t i = 0; i < count; ++i) {
        if (cells[i] != '#') continue;
        fill(x + static_cast<long>(i % 5) * scale, y + static_cast<long>(i / 5) * scale, scale,
             scale, c);
      }
      x += 6 * scale;
    }
    return x - start;
  }
  std::uint32_t width() const { return width_; }
  std::uint32_t height() const { return height_; }
  const Data& rgba() const { return rgba_; }

 private:
  std::uint32_t width_, height_;
  Data rgba_;
};

struct PixelRect {
  long left, top, right, bottom;
};

PixelRect toPixels(const Rect& box, const Canvas& canvas, int grow) {
  double w = canvas.width(), h = canvas.height();
  auto clampTo = [](double v, double limit) {
    return static_cast<long>(std::clamp(std::isfinite(v) ? v : 0.0, 0.0, limit - 1));
  };
  // Boxes are normalised with the origin at the bottom left; pixels count from the top.
  return {clampTo(box.origin.x * w, w) - grow,
          clampTo((1 - box.origin.y - box.size.height) * h, h) - grow,
          clampTo((box.origin.x + box.size.width) * w, w) + grow,
          clampTo((1 - box.origin.y) * h, h) + grow};
}

void strokeTree(Canvas& canvas, const RVRecognitionBlock& block, int thickness, int* paragraph) {
  auto level = std::min<std::uint64_t>(block.level(), 2);
  if (!(block.boundingBox().size.width >= 0 && block.boundingBox().size.height >= 0)) return;
  // Outer levels are drawn a little outside the inner ones so all three stay visible.
  PixelRect box =
      toPixels(block.boundingBox(), canvas, static_cast<int>(2 - level) * thickness * 2);
  canvas.stroke(box.left, box.top, box.right, box.bottom, kLevelColours[level], thickness);
  if (level == RVRecognitionBlockLevelParagraph) {
    // The paragraph's place in the reading order, in a tag left of its top corner.
    std::string number = std::to_string(++*paragraph);
    int scale = std::max(2, thickness * 2);
    long tagWidth = static_cast<long>(number.size()) * 6 * scale + scale;
    long x = std::max(0L, box.left - tagWidth), y = std::max(0L, box.top);
    canvas.fill(x, y, tagWidth, 8 * scale, kLevelColours[level]);
    canvas.text(x + scale, y + scale / 2, number, kPaper, scale);
  }
  for (const auto& child : block.children()) strokeTree(canvas, *child, thickness, paragraph);
}

void drawLegend(Canvas& canvas, int thickness) {
  int scale = std::max(2, thickness * 2);
  const char* names[] = {"column", "paragraph", "line"};
  long lineHeight = 10 * scale, width = 102 * scale;  // "= reading order" and its tag
  long x = 2 * scale, y = 2 * scale;
  canvas.fill(x, y, width, 4 * lineHeight + scale, kPaper);
  canvas.stroke(x, y, x + width, y + 4 * lineHeight + scale, kInk, 1);
  for (int i = 0; i < 3; ++i) {
    long top = y + scale + i * lineHeight;
    canvas.stroke(x + scale, top, x + 5 * scale, top + 6 * scale, kLevelColours[i], thickness);
    canvas.text(x + 8 * scale, top, names[i], kInk, scale);
  }
  long top = y + scale + 3 * lineHeight;
  canvas.fill(x + scale, top, 7 * scale, 8 * scale, kLevelColours[1]);
  canvas.text(x + 2 * scale, top + scale / 2, "1", kPaper, scale);
  canvas.text(x + 10 * scale, top, "= reading order", kInk, scale);
}

}  // namespace

std::string writeOverlay(const Bitmap& page, const RVBlockArray& columns, const std::string& out) {
  Canvas canvas(page.width(), page.height(), page.rgba());
  int thickness =
      static_cast<int>(std::max<std::uint32_t>(1, std::max(page.width(), page.height()) / 800));
  int paragraph = 0;
  for (const auto& column : columns) strokeTree(canvas, *column, thickness, &paragraph);
  drawLegend(canvas, thickness);
  auto drawn =
      Bitmap::fromRGBA(canvas.width(), canvas.height(), canvas.rgba().data(), canvas.rgba().size());
  auto png = drawn ? pngDataForBitmap(*drawn) : std::nullopt;
  if (!png) return "cannot encode the overlay";
  if (!writeFileAtomically(out, *png)) return "cannot write " + out;
  return "";
}

}  // namespace corvel::tool
