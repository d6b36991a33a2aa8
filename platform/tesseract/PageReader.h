// Internal: readings of a prepared page by the engine. A reading is one pass over a
// page (or a region of it) with one engine from the pool, taken inside the gate that
// keeps no more recognitions running than there are cores, and watched by the engine's
// progress monitor for cancellation, the deadline and a flood of specks. Beside the
// plain pass: a second look at blocks read poorly and at text no line covers, and the
// orientation detector.
#pragma once

#include <leptonica/allheaders.h>
#include <tesseract/baseapi.h>

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/tesseract/EnginePool.h"
#include "platform/tesseract/PagePreparation.h"
#include "platform/tesseract/TesseractStatistics.h"

namespace corvel::detail {

struct PixDeleter {
  void operator()(PIX* pix) const { pixDestroy(&pix); }
};
using PixPtr = std::unique_ptr<PIX, PixDeleter>;

// Admits at most `limit` holders at once.
class Gate {
 public:
  explicit Gate(unsigned limit) : free_(std::max(1u, limit)) {}
  void enter() {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return free_ > 0; });
    --free_;
  }
  void leave() {
    {
      std::lock_guard lock(mutex_);
      ++free_;
    }
    changed_.notify_one();
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  unsigned free_;
};

// A page as the engine gets it. Tesseract takes its own copy of every image it is given,
// so a page needs no copy of ours unless it has to change: it borrows the bitmap's
// pixels (read only; other jobs may read the same bitmap) until a step makes new ones.
struct Page {
  PIX* pix = nullptr;  // borrowed or owned
  PixPtr owned;
  int fileResolution = 0;  // what the file states, 0 when nothing
  int resolution = 0;      // told to the engine; 0: the engine estimates it
  // Where the measures saw characters, in this page's pixels; empty once turned.
  std::vector<detail::PageBox> characters;

  void replace(PIX* replacement) {
    owned.reset(replacement);
    pix = replacement;
  }
};

// The page for `bitmap` (borrowing its pixels), transparency composed over white; a
// page without pixels when that fails.
Page preparePage(const Bitmap& bitmap);
// Applies the plan's crop, scale and resolution; false when that fails.
bool applyPlan(Page& page, const PagePlan& plan);

struct PassResult {
  std::vector<RecognizedTextObservation> observations;
  std::string text;       // all lines, for language identification
  double characters = 0;  // not counting spaces
  double weight = 0;      // characters weighted by their line's confidence

  double meanConfidence() const { return characters > 0 ? weight / characters : 0; }
  // Appends a line, counting its characters and confidence into the totals.
  void add(RecognizedTextObservation line);
};

enum class Reading {
  Good,
  Unreadable,  // hardly any confidence: garbage, as from a page turned on its side
  Doubtful,    // low confidence
  Sparse,      // confident, but far fewer characters than the page shows
};

// How a reading compares with what the page shows.
Reading judge(const PassResult& result, const PagePlan& plan);

struct PassSettings {
  Threshold threshold = Threshold::Otsu;
  // The page as one block of rows rather than segmented into columns: the automatic
  // segmentation sometimes drops a column of short items (a receipt's prices).
  bool singleBlock = false;
  bool invertedLines = false;  // light text on a dark ground: always read inverted lines
};

// Why a pass stopped early.
enum class Stop { None, Cancelled, TimedOut, Overgrown };

// What the engine's progress monitor asks while it recognises: whether to stop.
struct Watch {
  const TextRecognitionRequest* request = nullptr;
  std::chrono::steady_clock::time_point deadline;
  double seconds = 0;  // the deadline's distance from the start, for the message
  int maxWords = 0;
  Stop stop = Stop::None;

  static bool shouldStop(void* self, int words) {
    auto* watch = static_cast<Watch*>(self);
    if (watch->request->isCancelled()) {
      watch->stop = Stop::Cancelled;
    } else if (std::chrono::steady_clock::now() > watch->deadline) {
      watch->stop = Stop::TimedOut;
    } else if (words > watch->maxWords) {
      // Specks the engine took for words: its paragraph step after recognition costs
      // the square of their number, so the pass is given up before it gets there.
      watch->stop = Stop::Overgrown;
    }
    return watch->stop != Stop::None;
  }
};

// `box`, normalised to `region` of a page `width` x `height` pixels, normalised to the
// whole page.
Rect toWhole(const Rect& box, PageBox region, double width, double height);

class PageReader {
 public:
  PageReader(std::string dataPath, std::uint64_t maxIdleModelBytes, unsigned maxConcurrent);
  PageReader(const PageReader&) = delete;
  PageReader& operator=(const PageReader&) = delete;

  EnginePool& pool() { return pool_; }
  const EnginePool& pool() const { return pool_; }
  detail::TesseractStatistics statistics() const;

  // One reading of `page` with `models` and the settings. False with *error when the
  // engine cannot start, fails, or is stopped (cancelled, past the deadline, or
  // overgrown with specks: watch.stop says which).
  bool recognisePass(const Page& page, const std::string& models, const PassSettings& settings,
                     Watch& watch, bool fast, PassResult* out, Error* error);
  // One reading of the part of `page` inside `region` (its pixels, clipped to the page)
  // as one block, with the lines' boxes normalised to the whole page.
  bool readRegion(const Page& page, PageBox region, const std::string& models,
                  PassSettings settings, Watch& watch, bool fast, PassResult* out, Error* error);
  // Blocks read as near garbage (a transcript's column of line numbers, which the engine
  // takes for vertical text) are read again alone as one block; the new reading replaces
  // the old where it is clearly more confident. False with *error only when stopped.
  bool rereadWeakBlocks(const Page& page, const std::string& models, PassSettings settings,
                        Watch& watch, bool fast, PassResult* result, Error* error);
  // Text the page's measures saw that no line covers (a column of line numbers or prices
  // the segmentation dropped) is read again region by region, each as one block; a
  // region's confident lines that overlap no line already read are added as blocks of
  // their own. False with *error only when stopped.
  bool readMissedRegions(const Page& page, const std::string& models, PassSettings settings,
                         Watch& watch, bool fast, PassResult* result, Error* error);

  struct Orientation {
    int rotateQuadrants = 0;  // clockwise quarter turns that make the page upright
    std::string script;       // "" when not trusted
  };
  // Orientation and script of the page; the zero answer when detection is not
  // installed or cannot tell.
  Orientation detectOrientation(const Page& page, Error* error);

 private:
  template <typename Recognise, typename Collect>
  bool withEngine(const EngineKey& key, Error* error, Recognise recognise, Collect collect);
  void record(double seconds, double cpuSeconds, double startSeconds, double startCpuSeconds,
              bool started);
  static void collectLines(tesseract::TessBaseAPI& api, PIX* page, PassResult* out);
  static void collectWords(const tesseract::LTRResultIterator& line, double width, double height,
                           std::vector<RecognizedWord>* words);

  EnginePool pool_;
  Gate gate_;
  mutable std::mutex statsMutex_;
  detail::TesseractStatistics stats_;
};

}  // namespace corvel::detail
