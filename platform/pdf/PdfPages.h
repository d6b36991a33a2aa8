// Internal: the geometry of a PDF page as viewers show it, shared by the reader and the
// text-layer writer.
#pragma once

#include <qpdf/QPDFPageObjectHelper.hh>

namespace corvel::detail {

// The visible part of a page (its crop box within its media box) and its rotation.
struct PageFrame {
  double x0 = 0, y0 = 0, width = 612, height = 792;  // user space, points
  int rotate = 0;                                    // 0, 90, 180 or 270, clockwise

  double displayWidth() const { return rotate % 180 == 0 ? width : height; }
  double displayHeight() const { return rotate % 180 == 0 ? height : width; }
  // The user-space point of a point on the page as displayed (points from its bottom
  // left corner).
  void toUser(double dx, double dy, double* ux, double* uy) const {
    double u = dx, v = dy;
    switch (rotate) {
      case 90:
        u = width - dy, v = dx;
        break;
      case 180:
        u = width - dx, v = height - dy;
        break;
      case 270:
        u = dy, v = height - dx;
        break;
      default:
        break;
    }
    *ux = x0 + u;
    *uy = y0 + v;
  }
};

// The frame of `page`; a page without a usable box is taken as US Letter.
PageFrame pageFrame(QPDFPageObjectHelper& page);

}  // namespace corvel::detail
