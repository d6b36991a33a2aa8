// Internal: how a page is prepared for the engine, chosen from what the page shows.
//
// Real pages differ in ways no single setting serves: an unevenly lit photograph needs
// an adaptive threshold (Sauvola), which wipes out light text on a dark slide or a dark
// table header and turns a textured background into thousands of specks that the
// engine's layout and paragraph steps then crawl over; a form scanned at 100 dpi needs
// its small text enlarged; a resolution written in a file is often the scanner's
// default rather than the truth. So each page is measured first, cheaply, on a reduced
// grey copy: both binarisations are tried and their character-like connected components
// counted, and the text height is taken from them. The measures choose the threshold,
// the scale and the resolution the engine is told.
#pragma once

#include <leptonica/allheaders.h>

#include <cstdint>
#include <vector>

namespace corvel::detail {

// The engine's own names for its binarisations (its "thresholding_method" values).
enum class Threshold { Otsu = 0, Sauvola = 2 };

// A rectangle of the page in pixels from its top left; empty when w is 0.
struct PageBox {
  int x = 0, y = 0, w = 0, h = 0;
};

// What one binarisation of the working copy shows: components of either polarity that
// do not touch the picture's edge.
struct Binarisation {
  int characters = 0;          // components of a character's height and shape
  int lightCharacters = 0;     // of them, light letters on a dark ground (not counters)
  int components = 0;          // all of them, noise included
  int tooSmall = 0;            // of them, a little lower than a character
  double medianHeight = 0;     // of the characters, in pixels of the page as given
  double medianAspect = 0;     // of the characters, width over height
  std::vector<PageBox> boxes;  // of the characters, in pixels of the page as given
};

struct PageMeasures {
  Binarisation otsu, sauvola;
  std::uint32_t width = 0, height = 0;  // of the page as given
  PageBox sheet;  // a lighter sheet on a darker surround, as a photographed page lies
  // Otsu turns a large share of the page dark (a shadow, a dark ground): only then is
  // Sauvola measured (otherwise `sauvola` repeats `otsu`).
  bool unevenlyLit = false;
};

// Measures `page` (1, 8 or 32 bits, no colour map, any alpha already composed). The
// work is done on a grey copy reduced to at most 1300 pixels on its long side (2600
// where the characters come out too small to see there).
PageMeasures measurePage(PIX* page);

struct PagePlan {
  Threshold threshold = Threshold::Otsu;
  // The other threshold may read more; worth a second pass when the first reads poorly.
  bool alternativeWorthTrying = false;
  double scale = 1;        // applied to the page before recognition
  int resolution = 0;      // told to the engine, after scaling; 0: the engine estimates it
  double textHeight = 0;   // median character height on the page as given, 0 when unknown
  int characters = 0;      // letters the chosen binarisation shows: a good reading's count is near
  bool sideways = false;   // the characters lie on their side: the page is turned
  bool lightText = false;  // some text is light on a dark ground
  PageBox crop;            // the part to read (the sheet), before scaling; empty: all
  std::vector<PageBox> characterBoxes;  // of the chosen binarisation, page as given
};

struct PlanLimits {
  double enlargeBelow;        // text smaller than this is enlarged ...
  double enlargeTo;           // ... to this height
  double maxTextHeight;       // larger text is reduced to this height (0: never reduced)
  std::uint32_t maxLongSide;  // the scaled page's long side stays within this (0: none)
};

// The preparation for a page with these measures; `fileResolution` is what its file
// states (0 when nothing).
PagePlan planPage(const PageMeasures& measures, int fileResolution, const PlanLimits& limits);

// The part of `page` inside `box`; nullptr when that fails.
PIX* cropPage(PIX* page, const PageBox& box);

// `page` scaled by `scale` (enlarged with linear interpolation, reduced with block
// means); nullptr when that fails. Bilevel pages become grey.
PIX* scalePage(PIX* page, double scale);

}  // namespace corvel::detail
