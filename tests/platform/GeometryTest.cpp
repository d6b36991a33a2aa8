#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <limits>
#include <random>

#include "Corvelbase/platform/Geometry.h"

namespace corvel {
namespace {

TEST(Geometry, UnionTreatsNullAsIdentityAndStandardises) {
  Rect a{0.1, 0.2, 0.3, 0.4};
  EXPECT_EQ(rectUnion(a, RectNull), a);
  EXPECT_EQ(rectUnion(RectNull, a), a);
  EXPECT_EQ(rectUnion(Rect{1, 1, -1, -1}, Rect{2, 2, 1, 1}), (Rect{0, 0, 3, 3}));
  // A zero-size rectangle still stretches the union to its origin.
  EXPECT_EQ(rectUnion(Rect{1, 1, 1, 1}, Rect{0, 0, 0, 0}), (Rect{0, 0, 2, 2}));
}

TEST(Geometry, IntersectionOfDisjointRectanglesIsNullWithZeroHeight) {
  Rect i = rectIntersection(Rect{0, 0, 1, 1}, Rect{2, 2, 1, 1});
  EXPECT_TRUE(rectIsNull(i));
  EXPECT_EQ(rectGetHeight(i), 0);
  // Touching edges meet in a line, which is empty but not null.
  Rect touch = rectIntersection(Rect{0, 0, 1, 1}, Rect{1, 0, 1, 1});
  EXPECT_FALSE(rectIsNull(touch));
  EXPECT_TRUE(rectIsEmpty(touch));
  EXPECT_EQ(rectIntersection(Rect{0, 0, 2, 2}, Rect{1, 1, 2, 2}), (Rect{1, 1, 1, 1}));
  // NaN never meets anything.
  double nan = std::numeric_limits<double>::quiet_NaN();
  EXPECT_TRUE(rectIsNull(rectIntersection(Rect{nan, 0, 1, 1}, Rect{0, 0, 1, 1})));
}

TEST(Geometry, ContainmentIncludesSharedEdgesAndEqualityIsAsStored) {
  Rect outer{0, 0, 1, 1};
  EXPECT_TRUE(rectContainsRect(outer, outer));
  EXPECT_FALSE(rectContainsRect(outer, Rect{0.5, 0.5, 0.6, 0.1}));
  EXPECT_FALSE(rectContainsRect(outer, RectNull));
  EXPECT_FALSE(rectContainsRect(RectNull, outer));
  // The same area with a negative size is a different rectangle.
  EXPECT_NE((Rect{0, 0, 1, 1}), (Rect{1, 1, -1, -1}));
}

TEST(RectText, WritesThePlatformFormAndReadsItBackExactly) {
  EXPECT_EQ(stringFromRect(Rect{400, 300, 200, 300}), "{{400, 300}, {200, 300}}");
  EXPECT_EQ(stringFromRect(Rect{-0.5, 1e-20, 0.1, 3}), "{{-0.5, 1e-20}, {0.1, 3}}");
  std::mt19937_64 rng(7);
  std::uniform_int_distribution<std::uint64_t> bits;
  for (int i = 0; i < 2000; ++i) {
    double v[4];  // any bits but NaN's
    for (double& d : v)
      while (std::isnan(d = std::bit_cast<double>(bits(rng)))) continue;
    Rect r{v[0], v[1], v[2], v[3]};
    ASSERT_EQ(rectFromString(stringFromRect(r)), r) << stringFromRect(r);
  }
  const double inf = std::numeric_limits<double>::infinity();
  Rect infinite{inf, -inf, 0, 1};
  EXPECT_EQ(rectFromString(stringFromRect(infinite)), infinite);
}

TEST(RectText, MalformedTextReadsAsMuchAsItHolds) {
  EXPECT_EQ(rectFromString("garbage"), RectZero);
  EXPECT_EQ(rectFromString("{{1, 2}}"), (Rect{1, 2, 0, 0}));
  EXPECT_EQ(rectFromString("1 2 3 4 5"), (Rect{1, 2, 3, 4}));
  EXPECT_EQ(rectFromString("{{+1.5e2,x-2}"), (Rect{150, -2, 0, 0}));
  EXPECT_EQ(rectFromString("{{1e999, 0}, {0, 0}}").origin.x,
            std::numeric_limits<double>::infinity());
}

}  // namespace
}  // namespace corvel
