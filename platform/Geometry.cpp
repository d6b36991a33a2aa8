#include "Corvelbase/platform/Geometry.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <limits>

namespace corvel {

namespace {
constexpr double kInf = std::numeric_limits<double>::infinity();
}  // namespace

const Rect RectNull{kInf, kInf, 0, 0};
const Rect RectZero{0, 0, 0, 0};

bool rectIsNull(const Rect& r) { return r.origin.x == kInf || r.origin.y == kInf; }

bool rectIsEmpty(const Rect& r) { return rectIsNull(r) || r.size.width == 0 || r.size.height == 0; }

Rect rectStandardize(const Rect& r) {
  if (rectIsNull(r)) return RectNull;
  Rect s = r;
  if (s.size.width < 0) {
    s.origin.x += s.size.width;
    s.size.width = -s.size.width;
  }
  if (s.size.height < 0) {
    s.origin.y += s.size.height;
    s.size.height = -s.size.height;
  }
  return s;
}

double rectGetMinX(const Rect& r) { return rectStandardize(r).origin.x; }
double rectGetMinY(const Rect& r) { return rectStandardize(r).origin.y; }
double rectGetMaxX(const Rect& r) {
  Rect s = rectStandardize(r);
  return s.origin.x + s.size.width;
}
double rectGetMaxY(const Rect& r) {
  Rect s = rectStandardize(r);
  return s.origin.y + s.size.height;
}
double rectGetWidth(const Rect& r) { return rectIsNull(r) ? 0 : std::fabs(r.size.width); }
double rectGetHeight(const Rect& r) { return rectIsNull(r) ? 0 : std::fabs(r.size.height); }

Rect rectUnion(const Rect& a, const Rect& b) {
  if (rectIsNull(a)) return rectStandardize(b);
  if (rectIsNull(b)) return rectStandardize(a);
  Rect s = rectStandardize(a), t = rectStandardize(b);
  // A rectangle that holds the other is the union as it stands: recomputing the size from
  // the edges would round, and a box grown by itself would change.
  if (rectContainsRect(s, t)) return s;
  if (rectContainsRect(t, s)) return t;
  double minX = std::min(s.origin.x, t.origin.x);
  double minY = std::min(s.origin.y, t.origin.y);
  double maxX = std::max(s.origin.x + s.size.width, t.origin.x + t.size.width);
  double maxY = std::max(s.origin.y + s.size.height, t.origin.y + t.size.height);
  return Rect{minX, minY, maxX - minX, maxY - minY};
}

Rect rectIntersection(const Rect& a, const Rect& b) {
  if (rectIsNull(a) || rectIsNull(b)) return RectNull;
  Rect s = rectStandardize(a), t = rectStandardize(b);
  double minX = std::max(s.origin.x, t.origin.x);
  double minY = std::max(s.origin.y, t.origin.y);
  double maxX = std::min(s.origin.x + s.size.width, t.origin.x + t.size.width);
  double maxY = std::min(s.origin.y + s.size.height, t.origin.y + t.size.height);
  // Written so that NaN edges, which compare false everywhere, also give null.
  if (!(minX <= maxX) || !(minY <= maxY)) return RectNull;
  return Rect{minX, minY, maxX - minX, maxY - minY};
}

bool rectContainsRect(const Rect& outer, const Rect& inner) {
  if (rectIsNull(outer) || rectIsNull(inner)) return false;
  Rect s = rectStandardize(outer), t = rectStandardize(inner);
  return s.origin.x <= t.origin.x && s.origin.y <= t.origin.y &&
         t.origin.x + t.size.width <= s.origin.x + s.size.width &&
         t.origin.y + t.size.height <= s.origin.y + s.size.height;
}

namespace {

void appendNumber(std::string& out, double v) {
  if (std::isnan(v)) {
    out += "nan";
    return;
  }
  if (std::isinf(v)) {
    out += v < 0 ? "-inf" : "inf";
    return;
  }
  char buffer[64];
  auto result = std::to_chars(buffer, buffer + sizeof buffer, v);
  out.append(buffer, result.ptr);
}

// Parses a number starting at `p`, or returns false. Accepts what to_chars writes plus
// a leading '+', and the words nan and inf.
bool parseNumber(const char*& p, const char* end, double& value) {
  const char* start = p;
  bool negative = false;
  if (*start == '+' || *start == '-') {
    negative = *start == '-';
    ++start;
  }
  if (start < end && (*start == 'n' || *start == 'i')) {
    std::string_view rest(start, static_cast<std::size_t>(end - start));
    if (rest.substr(0, 3) == "nan") {
      value = std::numeric_limits<double>::quiet_NaN();
      p = start + 3;
      return true;
    }
    if (rest.substr(0, 3) == "inf") {
      value = negative ? -kInf : kInf;
      p = start + 3;
      return true;
    }
    return false;
  }
  double parsed = 0;
  auto result = std::from_chars(start, end, parsed);
  if (result.ec == std::errc::invalid_argument) return false;
  if (result.ec == std::errc::result_out_of_range) {
    // Too large or too small for a double: read it the way strtod would.
    std::string text(start, result.ptr);
    parsed = std::strtod(text.c_str(), nullptr);
  }
  value = negative ? -parsed : parsed;
  p = result.ptr;
  return true;
}

}  // namespace

std::string stringFromRect(const Rect& r) {
  std::string out = "{{";
  appendNumber(out, r.origin.x);
  out += ", ";
  appendNumber(out, r.origin.y);
  out += "}, {";
  appendNumber(out, r.size.width);
  out += ", ";
  appendNumber(out, r.size.height);
  out += "}}";
  return out;
}

Rect rectFromString(std::string_view text) {
  double values[4] = {0, 0, 0, 0};
  int found = 0;
  const char* p = text.data();
  const char* end = p + text.size();
  while (p < end && found < 4) {
    double v = 0;
    if (parseNumber(p, end, v)) {
      values[found++] = v;
    } else {
      ++p;
    }
  }
  return Rect{values[0], values[1], values[2], values[3]};
}

}  // namespace corvel
