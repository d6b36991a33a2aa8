// Points, sizes and rectangles with the desktop platform's geometry semantics.
//
// Rectangles may have negative sizes; every operation below works on the standardised
// form (non-negative width and height) except equality, which compares the four doubles
// as stored. The null rectangle (origin at +infinity, size 0) stands for "no
// rectangle": it is what intersecting two rectangles that do not meet gives, and its
// width and height read 0.
#pragma once

#include <string>

#include "Corvelbase/Export.h"

namespace corvel {

struct Point {
  double x = 0;
  double y = 0;
  friend constexpr bool operator==(const Point&, const Point&) = default;
};

struct Size {
  double width = 0;
  double height = 0;
  friend constexpr bool operator==(const Size&, const Size&) = default;
};

struct Rect {
  Point origin;
  Size size;

  constexpr Rect() = default;
  constexpr Rect(double x, double y, double width, double height)
      : origin{x, y}, size{width, height} {}
  friend constexpr bool operator==(const Rect&, const Rect&) = default;
};

CORVEL_EXPORT extern const Rect RectNull;
CORVEL_EXPORT extern const Rect RectZero;

CORVEL_EXPORT bool rectIsNull(const Rect& r);
// True for the null rectangle and for any rectangle with zero width or height.
CORVEL_EXPORT bool rectIsEmpty(const Rect& r);
CORVEL_EXPORT Rect rectStandardize(const Rect& r);

// Edges of the standardised rectangle; the null rectangle reports +infinity edges and
// 0 for width and height.
CORVEL_EXPORT double rectGetMinX(const Rect& r);
CORVEL_EXPORT double rectGetMaxX(const Rect& r);
CORVEL_EXPORT double rectGetMinY(const Rect& r);
CORVEL_EXPORT double rectGetMaxY(const Rect& r);
CORVEL_EXPORT double rectGetWidth(const Rect& r);
CORVEL_EXPORT double rectGetHeight(const Rect& r);

// The smallest rectangle holding both; the null rectangle is the identity.
CORVEL_EXPORT Rect rectUnion(const Rect& a, const Rect& b);
// The common part; the null rectangle when the two do not meet. Rectangles that only
// touch meet in a rectangle of zero width or height.
CORVEL_EXPORT Rect rectIntersection(const Rect& a, const Rect& b);
// True when `inner` lies wholly inside `outer` (edges may coincide); false when either
// is null.
CORVEL_EXPORT bool rectContainsRect(const Rect& outer, const Rect& inner);

// The rectangle text form: "{{x, y}, {w, h}}". Numbers are written in their shortest
// form that reads back to the same double (whole numbers without a decimal point;
// "nan", "inf" and "-inf" for the non-finite), so rectFromString(stringFromRect(r)) == r
// for every rectangle with non-NaN values.
CORVEL_EXPORT std::string stringFromRect(const Rect& r);
// Reads up to four numbers in order, anything else separating them; missing numbers
// are 0, so malformed text gives the zero rectangle.
CORVEL_EXPORT Rect rectFromString(std::string_view text);

}  // namespace corvel
