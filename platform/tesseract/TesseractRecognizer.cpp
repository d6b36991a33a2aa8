// The Tesseract recogniser: page preparation, engine settings per level, automatic
// language detection and the conversion of Tesseract's lines into observations.
#include <omp.h>
#include <tesseract/ocrclass.h>
#include <tesseract/resultiterator.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <map>
#include <thread>

#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/image/BitmapNative.h"
#include "platform/tesseract/EnginePool.h"
#include "platform/tesseract/LanguageIdentification.h"
#include "platform/tesseract/PagePreparation.h"

namespace corvel {

using tesseract_backend::Engine;
using tesseract_backend::EngineKey;
using tesseract_backend::EnginePool;
using tesseract_backend::measurePage;
using tesseract_backend::PagePlan;
using tesseract_backend::PlanLimits;
using tesseract_backend::planPage;
using tesseract_backend::scalePage;
using tesseract_backend::Threshold;

namespace {

constexpr const char* kDebianDataPath = "/usr/share/tesseract-ocr/5/tessdata";
constexpr const char* kOrientationModel = "osd";

struct LanguageModel {
  const char* code;
  const char* model;
};
// Our supported languages, in the order we report them.
constexpr LanguageModel kLanguages[] = {
    {"en-US", "eng"},       {"fr-FR", "fra"},       {"de-DE", "deu"}, {"it-IT", "ita"},
    {"pt-BR", "por"},       {"es-ES", "spa"},       {"ru-RU", "rus"}, {"uk-UA", "ukr"},
    {"zh-Hans", "chi_sim"}, {"zh-Hant", "chi_tra"}, {"ja-JP", "jpn"}, {"ko-KR", "kor"}};
// Codes a caller may also send; they read with the models of the written language.
constexpr LanguageModel kAliases[] = {{"yue-Hans", "chi_sim"}, {"yue-Hant", "chi_tra"}};
// What a page reads with when its script cannot be trusted.
constexpr const char* kLatinModels[] = {"eng", "fra", "deu", "ita", "por", "spa"};

// Orientation and script detection below these confidences is a guess.
constexpr float kMinOrientationConfidence = 2.0f;
constexpr float kMinScriptConfidence = 1.0f;
// A page read with a detected script's model whose lines average less than this is read
// again with the Latin languages.
constexpr double kMinDetectedConfidence = 0.75;
// Images whose short side is below this many pixels hold too little text to tell their
// orientation.
constexpr int kMinOrientationSide = 300;
// Text smaller than this many pixels is enlarged before recognition: the engine reads
// small text far better enlarged (forms scanned at 100 dpi lose half their words).
constexpr double kEnlargeBelow = 12, kEnlargeTo = 15;
constexpr double kFastEnlargeBelow = 10, kFastEnlargeTo = 14;
constexpr std::uint32_t kMaxScaledLongSide = 8000;
// A reading is poor below this mean confidence, or with fewer characters than this
// share of the character-like shapes the page shows (when it shows enough to judge).
constexpr double kPoorConfidence = 0.75, kUnreadableConfidence = 0.5;
constexpr double kPoorCoverage = 0.6;
constexpr int kMinCharactersToJudge = 40;
// A second binarisation is kept when its confidence-weighted characters exceed the
// first's by this factor; a turned page must beat the upright one by more, and by this
// much mean confidence.
constexpr double kBetterWeight = 1.05;
constexpr double kTurnedWeight = 1.3;
constexpr double kTurnedConfidenceGain = 0.1;
// A block (no more than this share of the page) read with less confidence than this is
// read again on its own, and replaced when that reading gains this much confidence.
constexpr double kWeakBlockConfidence = 0.5, kWeakBlockGain = 0.25;
constexpr double kMaxWeakBlockShare = 0.3;
constexpr int kRegionMargin = 4;
// Characters the measures saw whose centre lies in no line (widened by this many
// pixels) were missed; clusters of at least this many (and pages with at most so many
// missed, past which the page is a picture rather than missed text) are read again, at
// most this many regions a page, and kept at this confidence, line by line where a
// line overlaps no line read before by more than this share of its own box.
constexpr int kCoverMargin = 3;
constexpr std::size_t kMinMissedCharacters = 4, kMaxMissedCharacters = 600;
constexpr int kMaxMissedRegions = 8;
constexpr double kClusterXGap = 1.5, kClusterYGap = 3.0;
constexpr double kMinClusterHeight = 0.6, kMaxClusterHeight = 1.6;
constexpr double kMissedConfidence = 0.7;
constexpr double kMaxOverlap = 0.3;
// A pass that finds more words than this (at least, and per megapixel) is reading specks.
constexpr int kMinWordLimit = 20000;
constexpr double kWordsPerMegapixel = 2500;

// Debian's libtesseract runs its own OpenMP threads (four per parallel region); with
// several recognitions at once they only compete with each other for the cores and make
// recognition several times slower. Parallelism comes from the queue instead, so nested
// regions are switched off on every thread before it first recognises. (Setting
// OMP_THREAD_LIMIT from inside the process comes too late to matter.)
void keepEngineOnThisThread() {
  thread_local bool done = false;
  if (done) return;
  omp_set_max_active_levels(0);
  done = true;
}

double threadCpuSeconds() {
  timespec now{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

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

std::string modelForCode(const std::string& code) {
  for (const auto& entry : kLanguages)
    if (code == entry.code) return entry.model;
  for (const auto& entry : kAliases)
    if (code == entry.code) return entry.model;
  return "";
}

std::string join(const std::vector<std::string>& models) {
  std::string out;
  for (const auto& model : models) out += (out.empty() ? "" : "+") + model;
  return out;
}

// The model of a script Tesseract's orientation detection names, or "" when we have
// none for it.
std::string modelForScript(const std::string& script) {
  if (script == "Latin") return "eng";
  if (script == "Cyrillic") return "rus";
  if (script == "Han") return "chi_sim";
  if (script == "Japanese" || script == "Katakana" || script == "Hiragana") return "jpn";
  if (script == "Hangul" || script == "Korean") return "kor";
  return "";
}

std::string trimmed(const char* text) {
  std::string s = text ? text : "";
  auto isSpace = [](unsigned char c) { return c == ' ' || c == '\n' || c == '\r' || c == '\t'; };
  while (!s.empty() && isSpace(static_cast<unsigned char>(s.back()))) s.pop_back();
  std::size_t start = 0;
  while (start < s.size() && isSpace(static_cast<unsigned char>(s[start]))) ++start;
  return s.substr(start);
}

// A page as the engine gets it. Tesseract takes its own copy of every image it is given,
// so a page needs no copy of ours unless it has to change: it borrows the bitmap's
// pixels (read only; other jobs may read the same bitmap) until a step makes new ones.
struct Page {
  PIX* pix = nullptr;  // borrowed or owned
  PixPtr owned;
  int fileResolution = 0;  // what the file states, 0 when nothing
  int resolution = 0;      // told to the engine; 0: the engine estimates it
  // Where the measures saw characters, in this page's pixels; empty once turned.
  std::vector<tesseract_backend::PageBox> characters;

  void replace(PIX* replacement) {
    owned.reset(replacement);
    pix = replacement;
  }
};

// The page for `bitmap`, or a page without pixels when preparing it fails.
Page preparePage(const Bitmap& bitmap) {
  Page page;
  page.pix = bitmap.native().pix;
  page.fileResolution = pixGetYRes(page.pix);
  // Transparency is composed over white: transparent pixels are often black underneath.
  if (pixGetDepth(page.pix) == 32 && pixGetSpp(page.pix) == 4) {
    page.replace(pixAlphaBlendUniform(page.pix, 0xffffff00));
    if (page.pix) pixSetSpp(page.pix, 3);
  }
  return page;
}

// Reduces the page so that its long side is at most `maxLongSide`; false when that
// fails. A page from a handler usually fits already: the image was reduced in the same
// way while it was decoded.
bool capLongSide(Page& page, std::uint32_t maxLongSide) {
  int longSide = std::max(pixGetWidth(page.pix), pixGetHeight(page.pix));
  if (maxLongSide == 0 || longSide <= static_cast<int>(maxLongSide)) return true;
  float scale = static_cast<float>(maxLongSide) / static_cast<float>(longSide);
  PIX* reduced = reducePix(page.pix, maxLongSide);
  if (!reduced) return false;
  page.replace(reduced);
  page.fileResolution = static_cast<int>(static_cast<float>(page.fileResolution) * scale);
  return true;
}

// Applies the plan's crop, scale and resolution; false when that fails.
bool applyPlan(Page& page, const PagePlan& plan) {
  if (plan.crop.w > 0) {
    PIX* cropped = tesseract_backend::cropPage(page.pix, plan.crop);
    if (!cropped) return false;
    page.replace(cropped);
  }
  if (plan.scale != 1) {
    PIX* scaled = scalePage(page.pix, plan.scale);
    if (!scaled) return false;
    page.replace(scaled);
  }
  page.resolution = plan.resolution;
  for (const auto& box : plan.characterBoxes) {
    page.characters.push_back({static_cast<int>((box.x - plan.crop.x) * plan.scale),
                               static_cast<int>((box.y - plan.crop.y) * plan.scale),
                               static_cast<int>(box.w * plan.scale),
                               static_cast<int>(box.h * plan.scale)});
  }
  return true;
}

struct PassResult {
  std::vector<RecognizedTextObservation> observations;
  std::string text;       // all lines, for language identification
  double characters = 0;  // not counting spaces
  double weight = 0;      // characters weighted by their line's confidence

  double meanConfidence() const { return characters > 0 ? weight / characters : 0; }
};

enum class Reading {
  Good,
  Unreadable,  // hardly any confidence: garbage, as from a page turned on its side
  Doubtful,    // low confidence
  Sparse,      // confident, but far fewer characters than the page shows
};

Reading judge(const PassResult& result, const PagePlan& plan) {
  if (result.meanConfidence() < kUnreadableConfidence) return Reading::Unreadable;
  if (result.meanConfidence() < kPoorConfidence) return Reading::Doubtful;
  if (plan.characters >= kMinCharactersToJudge &&
      result.characters < kPoorCoverage * plan.characters) {
    return Reading::Sparse;
  }
  return Reading::Good;
}

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

int maxWordsFor(PIX* page) {
  double megapixels = static_cast<double>(pixGetWidth(page)) * pixGetHeight(page) / 1e6;
  return std::max(kMinWordLimit, static_cast<int>(kWordsPerMegapixel * megapixels));
}

std::string secondsText(double seconds) {
  char text[32];
  std::snprintf(text, sizeof text, "%.0f", seconds);
  return text;
}

}  // namespace

struct TesseractRecognizer::Impl {
  Options options;
  EnginePool pool;
  Gate gate;
  bool available = false;
  std::vector<std::string> installedCodes;  // in our order
  mutable std::mutex statsMutex;
  Statistics stats;

  Impl(Options o, std::string dataPath)
      : options(o),
        pool(std::move(dataPath), o.maxIdleModelBytes),
        gate(o.maxConcurrentRecognitions ? o.maxConcurrentRecognitions
                                         : std::max(1u, std::thread::hardware_concurrency())) {
    for (const auto& entry : kLanguages) {
      if (isInstalled(entry.model)) installedCodes.push_back(entry.code);
    }
    available = !installedCodes.empty();
  }

  bool isInstalled(const std::string& model) const { return pool.modelBytes(model) > 0; }

  void record(double seconds, double cpuSeconds, double startSeconds, double startCpuSeconds,
              bool started) {
    std::lock_guard lock(statsMutex);
    ++stats.recognitions;
    stats.recognitionSeconds += seconds;
    stats.recognitionCpuSeconds += cpuSeconds;
    if (started) {
      ++stats.enginesStarted;
      stats.engineStartSeconds += startSeconds;
      stats.engineStartCpuSeconds += startCpuSeconds;
    }
  }

  // Runs `recognise` and then `collect` on an engine for `key` inside the gate; false
  // with *error when no engine can start. Only `recognise` and the engine's clean-up
  // count as the engine's time: reading its results into ours is our own work.
  template <typename Recognise, typename Collect>
  bool withEngine(const EngineKey& key, Error* error, Recognise recognise, Collect collect) {
    // Engines are taken inside the gate, so no more of them run (or start) than there
    // are cores, and the pool never holds more engines per key than that.
    gate.enter();
    double cpuStarted = threadCpuSeconds();
    std::string failure;
    double startSeconds = 0;
    auto engine = pool.acquire(key, &failure, &startSeconds);
    double startCpuSeconds = threadCpuSeconds() - cpuStarted;
    if (!engine) {
      gate.leave();
      *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure, failure);
      return false;
    }
    auto clock = std::chrono::steady_clock::now();
    cpuStarted = threadCpuSeconds();
    bool recognised = recognise(engine->api);
    double cpuSeconds = threadCpuSeconds() - cpuStarted;
    double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - clock).count();
    if (recognised) collect(engine->api);
    // An idle engine keeps no page: its copy and results go with the job.
    clock = std::chrono::steady_clock::now();
    cpuStarted = threadCpuSeconds();
    engine->api.Clear();
    cpuSeconds += threadCpuSeconds() - cpuStarted;
    seconds += std::chrono::duration<double>(std::chrono::steady_clock::now() - clock).count();
    pool.release(std::move(engine));
    gate.leave();
    record(seconds, cpuSeconds, startSeconds, startCpuSeconds, startSeconds > 0);
    return true;
  }

  struct Orientation {
    int rotateQuadrants = 0;  // clockwise quarter turns that make the page upright
    std::string script;       // "" when not trusted
  };

  // Orientation and script of the page; the zero answer when detection is not
  // installed or cannot tell.
  Orientation detectOrientation(const Page& page, Error* error) {
    Orientation result;
    if (!isInstalled(kOrientationModel)) return result;
    int degrees = 0;
    float orientationConfidence = 0, scriptConfidence = 0;
    const char* script = nullptr;
    auto detect = [&](tesseract::TessBaseAPI& api) {
      api.SetPageSegMode(tesseract::PSM_OSD_ONLY);
      api.SetImage(page.pix);
      api.SetSourceResolution(page.resolution);
      return api.DetectOrientationScript(&degrees, &orientationConfidence, &script,
                                         &scriptConfidence);
    };
    auto collect = [&](tesseract::TessBaseAPI&) {
      // `degrees` is how far the page's text is turned clockwise from upright; turning
      // the page clockwise by the rest of a full turn makes it upright.
      if (orientationConfidence >= kMinOrientationConfidence && degrees % 90 == 0) {
        result.rotateQuadrants = ((360 - degrees) / 90) % 4;
      }
      // The engine owns the script's name.
      if (script && scriptConfidence >= kMinScriptConfidence) result.script = script;
    };
    withEngine({kOrientationModel, true}, error, detect, collect);
    return result;
  }

  // One reading of `page` with `models` and a binarisation. False with *error when the
  // engine cannot start, fails, or is stopped (cancelled, past the deadline, or
  // overgrown with specks: *stop says which).
  bool recognisePass(const Page& page, const std::string& models, const PassSettings& settings,
                     Watch& watch, bool fast, PassResult* out, Error* error) {
    EngineKey key{models, watch.request->usesLanguageCorrection()};
    bool recognised = false;
    watch.stop = Stop::None;
    watch.maxWords = maxWordsFor(page.pix);
    auto recognise = [&](tesseract::TessBaseAPI& api) {
      api.SetPageSegMode(settings.singleBlock ? tesseract::PSM_SINGLE_BLOCK : tesseract::PSM_AUTO);
      api.SetVariable("thresholding_method", settings.threshold == Threshold::Sauvola ? "2" : "0");
      // Reading every poor line a second time inverted costs the fast level too much,
      // unless the page has light text on a dark ground, which only that reads.
      api.SetVariable("tessedit_do_invert", fast && !settings.invertedLines ? "0" : "1");
      api.SetImage(page.pix);
      // 0 leaves the engine to assume its lowest credible resolution and estimate the
      // real one from the text it finds.
      api.SetSourceResolution(page.resolution);
      tesseract::ETEXT_DESC monitor;
      monitor.cancel = &Watch::shouldStop;
      monitor.cancel_this = &watch;
      recognised = api.Recognize(&monitor) == 0 && watch.stop == Stop::None;
      return recognised;
    };
    auto collect = [&](tesseract::TessBaseAPI& api) { collectLines(api, page.pix, out); };
    bool started = withEngine(key, error, recognise, collect);
    if (!started) return false;
    if (recognised) return true;
    switch (watch.stop) {
      case Stop::Cancelled:
        *error = makeTextRecognitionError(TextRecognitionErrorCancelled,
                                          "the recognition was cancelled");
        break;
      case Stop::TimedOut:
        *error = makeTextRecognitionError(
            TextRecognitionErrorTimedOut,
            "the recognition ran past its deadline of " + secondsText(watch.seconds) + " s");
        break;
      case Stop::Overgrown:
        *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure,
                                          "the page reads as more than " +
                                              std::to_string(watch.maxWords) +
                                              " words of specks; it is too noisy to recognise");
        break;
      case Stop::None:
        *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure,
                                          "the recognition engine failed on the image");
        break;
    }
    return false;
  }

  // One reading of the part of `page` inside `region` (its pixels, clipped to the page)
  // as one block, with the lines' boxes normalised to the whole page. False with *error
  // as recognisePass.
  bool readRegion(const Page& page, tesseract_backend::PageBox region, const std::string& models,
                  PassSettings settings, Watch& watch, bool fast, PassResult* out, Error* error) {
    int width = pixGetWidth(page.pix), height = pixGetHeight(page.pix);
    region.w = std::min(region.w, width - region.x);
    region.h = std::min(region.h, height - region.y);
    Page part;
    if (region.w <= 0 || region.h <= 0) return true;
    part.replace(tesseract_backend::cropPage(page.pix, region));
    if (!part.pix) return true;
    part.resolution = page.resolution;
    settings.singleBlock = true;
    if (!recognisePass(part, models, settings, watch, fast, out, error)) return false;
    double w = width, h = height;
    for (auto& line : out->observations) {
      Rect& box = line.boundingBox;
      double top = region.y + (1 - box.origin.y - box.size.height) * region.h;
      box =
          Rect((region.x + box.origin.x * region.w) / w, 1 - (top + box.size.height * region.h) / h,
               box.size.width * region.w / w, box.size.height * region.h / h);
    }
    return true;
  }

  // Blocks read as near garbage (a transcript's column of line numbers, which the
  // engine takes for vertical text) are read again on their own as one block of rows;
  // the new reading replaces the old where it is clearly more confident. False with
  // *error only when the recognition is stopped.
  bool rereadWeakBlocks(const Page& page, const std::string& models, PassSettings settings,
                        Watch& watch, bool fast, PassResult* result, Error* error) {
    struct Block {
      std::size_t first = 0, count = 0;
      double characters = 0, weight = 0;
      Rect box;
    };
    std::vector<Block> blocks;
    const auto& observations = result->observations;
    for (std::size_t i = 0; i < observations.size(); ++i) {
      if (blocks.empty() || observations[i].block != observations[blocks.back().first].block) {
        blocks.push_back({i, 0, 0, 0, observations[i].boundingBox});
      }
      Block& block = blocks.back();
      double characters = static_cast<double>(observations[i].candidates[0].string.size());
      ++block.count;
      block.characters += characters;
      block.weight += characters * observations[i].candidates[0].confidence;
      block.box = rectUnion(block.box, observations[i].boundingBox);
    }
    double width = pixGetWidth(page.pix), height = pixGetHeight(page.pix);
    bool changed = false;
    std::vector<RecognizedTextObservation> merged;
    std::size_t copied = 0;
    for (const Block& block : blocks) {
      double confidence = block.characters > 0 ? block.weight / block.characters : 0;
      if (confidence >= kWeakBlockConfidence ||
          block.box.size.width * block.box.size.height > kMaxWeakBlockShare) {
        continue;
      }
      tesseract_backend::PageBox region{
          std::max(0, static_cast<int>(block.box.origin.x * width) - kRegionMargin),
          std::max(0, static_cast<int>((1 - block.box.origin.y - block.box.size.height) * height) -
                          kRegionMargin),
          static_cast<int>(block.box.size.width * width) + 2 * kRegionMargin,
          static_cast<int>(block.box.size.height * height) + 2 * kRegionMargin};
      PassResult again;
      Error failure;
      if (!readRegion(page, region, models, settings, watch, fast, &again, &failure)) {
        if (failure.code == TextRecognitionErrorCancelled ||
            failure.code == TextRecognitionErrorTimedOut) {
          *error = failure;
          return false;
        }
        continue;
      }
      if (again.observations.empty() || again.meanConfidence() < confidence + kWeakBlockGain) {
        continue;
      }
      merged.insert(merged.end(), observations.begin() + static_cast<std::ptrdiff_t>(copied),
                    observations.begin() + static_cast<std::ptrdiff_t>(block.first));
      for (auto& line : again.observations) {
        line.block = observations[block.first].block;
        line.paragraph = observations[block.first].paragraph;
        merged.push_back(std::move(line));
      }
      copied = block.first + block.count;
      changed = true;
    }
    if (!changed) return true;
    merged.insert(merged.end(), observations.begin() + static_cast<std::ptrdiff_t>(copied),
                  observations.end());
    PassResult rebuilt;
    for (auto& line : merged) {
      std::string text = toUTF8(line.candidates[0].string);
      auto characters = static_cast<double>(
          std::count_if(text.begin(), text.end(), [](char c) { return c != ' '; }));
      rebuilt.characters += characters;
      rebuilt.weight += characters * line.candidates[0].confidence;
      rebuilt.text += text + "\n";
      rebuilt.observations.push_back(std::move(line));
    }
    *result = std::move(rebuilt);
    return true;
  }

  // Text the page shows that no line covers (a column of line numbers or prices the
  // segmentation dropped) is read again region by region, each as one block; a
  // region's confident lines that overlap no line already read are added as blocks of
  // their own. False with *error only when the recognition is stopped.
  bool readMissedRegions(const Page& page, const std::string& models, PassSettings settings,
                         Watch& watch, bool fast, PassResult* result, Error* error) {
    using tesseract_backend::PageBox;
    double width = pixGetWidth(page.pix), height = pixGetHeight(page.pix);
    auto pixels = [&](const Rect& box) {
      return PageBox{static_cast<int>(box.origin.x * width),
                     static_cast<int>((1 - box.origin.y - box.size.height) * height),
                     static_cast<int>(box.size.width * width),
                     static_cast<int>(box.size.height * height)};
    };
    std::vector<PageBox> lines;
    for (const auto& line : result->observations) lines.push_back(pixels(line.boundingBox));
    std::vector<PageBox> missed;
    for (const auto& c : page.characters) {
      int cx = c.x + c.w / 2, cy = c.y + c.h / 2;
      bool covered = std::any_of(lines.begin(), lines.end(), [&](const PageBox& l) {
        return cx >= l.x - kCoverMargin && cx < l.x + l.w + kCoverMargin &&
               cy >= l.y - kCoverMargin && cy < l.y + l.h + kCoverMargin;
      });
      if (!covered) missed.push_back(c);
    }
    if (missed.size() < kMinMissedCharacters || missed.size() > kMaxMissedCharacters) return true;
    std::vector<int> heights;
    for (const auto& c : missed) heights.push_back(c.h);
    std::nth_element(heights.begin(), heights.begin() + heights.size() / 2, heights.end());
    int h = std::max(1, heights[heights.size() / 2]);
    // Clusters: characters close enough to be a word, a line, or a column of short lines.
    std::vector<std::size_t> parent(missed.size());
    for (std::size_t i = 0; i < parent.size(); ++i) parent[i] = i;
    auto root = [&](std::size_t i) {
      while (parent[i] != i) i = parent[i] = parent[parent[i]];
      return i;
    };
    for (std::size_t i = 0; i < missed.size(); ++i) {
      for (std::size_t j = i + 1; j < missed.size(); ++j) {
        const PageBox &a = missed[i], &b = missed[j];
        int xGap = std::max(a.x, b.x) - std::min(a.x + a.w, b.x + b.w);
        int yGap = std::max(a.y, b.y) - std::min(a.y + a.h, b.y + b.h);
        if (xGap < kClusterXGap * h && yGap < kClusterYGap * h) parent[root(j)] = root(i);
      }
    }
    // Only clusters of characters about as high as the page's text: a picture's specks
    // vary, and a picture read as text is garbage.
    std::vector<double> pageHeights;
    for (const auto& c : page.characters) pageHeights.push_back(c.h);
    std::nth_element(pageHeights.begin(), pageHeights.begin() + pageHeights.size() / 2,
                     pageHeights.end());
    double textHeight = pageHeights[pageHeights.size() / 2];
    std::map<std::size_t, std::vector<int>> clusterHeights;
    for (std::size_t i = 0; i < missed.size(); ++i) clusterHeights[root(i)].push_back(missed[i].h);
    std::map<std::size_t, std::pair<PageBox, std::size_t>> clusters;
    for (std::size_t i = 0; i < missed.size(); ++i) {
      auto [it, fresh] = clusters.try_emplace(root(i), missed[i], 0);
      PageBox& box = it->second.first;
      if (!fresh) {
        int right = std::max(box.x + box.w, missed[i].x + missed[i].w);
        int bottom = std::max(box.y + box.h, missed[i].y + missed[i].h);
        box.x = std::min(box.x, missed[i].x);
        box.y = std::min(box.y, missed[i].y);
        box.w = right - box.x;
        box.h = bottom - box.y;
      }
      ++it->second.second;
    }
    std::size_t nextBlock = 0, nextParagraph = 0;
    for (const auto& line : result->observations) {
      nextBlock = std::max(nextBlock, line.block + 1);
      nextParagraph = std::max(nextParagraph, line.paragraph + 1);
    }
    int regions = 0;
    for (const auto& [key, cluster] : clusters) {
      const auto& [box, count] = cluster;
      auto& ownHeights = clusterHeights[key];
      std::nth_element(ownHeights.begin(), ownHeights.begin() + ownHeights.size() / 2,
                       ownHeights.end());
      double ownHeight = ownHeights[ownHeights.size() / 2];
      if (ownHeight < kMinClusterHeight * textHeight ||
          ownHeight > kMaxClusterHeight * textHeight) {
        continue;
      }
      if (count < kMinMissedCharacters || regions == kMaxMissedRegions ||
          static_cast<double>(box.w) * box.h > kMaxWeakBlockShare * width * height) {
        continue;
      }
      ++regions;
      int margin = h / 2 + kRegionMargin;
      PageBox region{std::max(0, box.x - margin), std::max(0, box.y - margin), box.w + 2 * margin,
                     box.h + 2 * margin};
      PassResult again;
      Error failure;
      if (!readRegion(page, region, models, settings, watch, fast, &again, &failure)) {
        if (failure.code == TextRecognitionErrorCancelled ||
            failure.code == TextRecognitionErrorTimedOut) {
          *error = failure;
          return false;
        }
        continue;
      }
      if (again.meanConfidence() < kMissedConfidence) continue;
      bool added = false;
      for (auto& line : again.observations) {
        PageBox l = pixels(line.boundingBox);
        bool overlaps = std::any_of(lines.begin(), lines.end(), [&](const PageBox& o) {
          int w = std::min(l.x + l.w, o.x + o.w) - std::max(l.x, o.x);
          int hh = std::min(l.y + l.h, o.y + o.h) - std::max(l.y, o.y);
          return w > 0 && hh > 0 && static_cast<double>(w) * hh > kMaxOverlap * l.w * l.h;
        });
        if (overlaps) continue;
        std::string text = toUTF8(line.candidates[0].string);
        auto characters = static_cast<double>(
            std::count_if(text.begin(), text.end(), [](char ch) { return ch != ' '; }));
        result->characters += characters;
        result->weight += characters * line.candidates[0].confidence;
        result->text += text + "\n";
        line.block = nextBlock;
        line.paragraph = nextParagraph;
        lines.push_back(l);
        result->observations.push_back(std::move(line));
        added = true;
      }
      if (added) ++nextBlock, ++nextParagraph;
    }
    return true;
  }

  static void collectLines(tesseract::TessBaseAPI& api, PIX* page, PassResult* out) {
    std::unique_ptr<tesseract::ResultIterator> results(api.GetIterator());
    if (!results) return;
    // The result iterator's own stepping and text put words in right-to-left reading
    // order where a line needs it, and to find out it walks the page from its start for
    // every line: a hundred times the cost of the rest. Every language we read runs left
    // to right, so lines are read through the left-to-right iterator it is built on.
    tesseract::LTRResultIterator* it = results.get();
    double width = pixGetWidth(page), height = pixGetHeight(page);
    std::size_t blocks = 0, paragraphs = 0;
    do {
      if (it->PageIterator::IsAtBeginningOf(tesseract::RIL_BLOCK)) ++blocks;
      if (it->PageIterator::IsAtBeginningOf(tesseract::RIL_PARA)) ++paragraphs;
      if (it->Empty(tesseract::RIL_TEXTLINE)) continue;
      std::unique_ptr<char[]> raw(it->LTRResultIterator::GetUTF8Text(tesseract::RIL_TEXTLINE));
      std::string text = trimmed(raw.get());
      int left = 0, top = 0, right = 0, bottom = 0;
      if (text.empty() || !it->BoundingBox(tesseract::RIL_TEXTLINE, &left, &top, &right, &bottom)) {
        continue;
      }
      RecognizedTextObservation observation;
      // Tesseract counts pixels from the top left; observations are normalised with the
      // origin at the bottom left.
      observation.boundingBox = Rect(left / width, 1.0 - bottom / height, (right - left) / width,
                                     (bottom - top) / height);
      float confidence = std::clamp(
          it->LTRResultIterator::Confidence(tesseract::RIL_TEXTLINE) / 100.0f, 0.0f, 1.0f);
      observation.candidates.push_back({fromUTF8(text), confidence});
      observation.block = blocks - 1;
      observation.paragraph = paragraphs - 1;
      auto characters = static_cast<double>(
          std::count_if(text.begin(), text.end(), [](char c) { return c != ' '; }));
      out->characters += characters;
      out->weight += characters * confidence;
      out->observations.push_back(std::move(observation));
      out->text += text + "\n";
    } while (it->PageIterator::Next(tesseract::RIL_TEXTLINE));
  }

  // The models for the request's own codes; false with *error for a code we cannot read.
  bool modelsForCodes(const std::vector<std::string>& codes, std::string* models, Error* error) {
    std::vector<std::string> list;
    for (const auto& code : codes) {
      std::string model = modelForCode(code);
      if (model.empty() || !isInstalled(model)) {
        *error = makeTextRecognitionError(
            TextRecognitionErrorUnsupportedLanguage,
            model.empty() ? "the recognition language \"" + code + "\" is not supported"
                          : "the recognition language \"" + code + "\" is not installed (" + model +
                                ".traineddata)");
        return false;
      }
      if (std::find(list.begin(), list.end(), model) == list.end()) list.push_back(model);
    }
    *models = join(list);
    return true;
  }

  std::string latinModels() const {
    std::vector<std::string> list;
    for (const char* model : kLatinModels)
      if (isInstalled(model)) list.push_back(model);
    return list.empty() ? "" : join(list);
  }
};

TesseractRecognizer::TesseractRecognizer(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}
TesseractRecognizer::~TesseractRecognizer() = default;

std::shared_ptr<TesseractRecognizer> TesseractRecognizer::init(Options options) {
  std::string dataPath = options.dataPath;
  if (dataPath.empty()) {
    const char* prefix = std::getenv("TESSDATA_PREFIX");
    dataPath = prefix && *prefix ? prefix : kDebianDataPath;
  }
  return std::shared_ptr<TesseractRecognizer>(
      new TesseractRecognizer(std::make_unique<Impl>(options, dataPath)));
}

bool TesseractRecognizer::isAvailable() const { return impl_->available; }

std::string TesseractRecognizer::modelForLanguageCode(const std::string& code) {
  return modelForCode(code);
}

std::optional<std::vector<std::string>> TesseractRecognizer::supportedRecognitionLanguages(
    std::int64_t /*level*/, std::int64_t /*revision*/, Error* error) {
  if (!impl_->available) {
    *error = makeTextRecognitionError(
        TextRecognitionErrorNoRecognizer,
        "no Tesseract language data is installed in " + impl_->pool.dataPath());
    return std::nullopt;
  }
  return impl_->installedCodes;  // every model reads at both levels
}

namespace {

bool isStop(const Error& error) {
  return error.code == TextRecognitionErrorCancelled || error.code == TextRecognitionErrorTimedOut;
}

}  // namespace

std::optional<std::vector<RecognizedTextObservation>> TesseractRecognizer::recognize(
    const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) {
  keepEngineOnThisThread();
  Impl& impl = *impl_;
  bool fast = request.recognitionLevel() == TextRecognitionLevelFast;
  bool detect = request.recognitionLanguages().empty() && request.automaticallyDetectsLanguage();

  std::string models = "eng";
  if (!request.recognitionLanguages().empty() &&
      !impl.modelsForCodes(request.recognitionLanguages(), &models, error)) {
    return std::nullopt;
  }
  Page page = preparePage(bitmap);
  bool prepared = page.pix && (!fast || capLongSide(page, impl.options.fastMaxLongSide));
  PagePlan plan;
  if (prepared) {
    PlanLimits limits =
        fast ? PlanLimits{kFastEnlargeBelow, kFastEnlargeTo, 0, impl.options.fastMaxLongSide}
             : PlanLimits{kEnlargeBelow, kEnlargeTo, 0, kMaxScaledLongSide};
    plan = planPage(measurePage(page.pix), page.fileResolution, limits);
    prepared = applyPlan(page, plan);
  }
  if (!prepared) {
    *error = makeTextRecognitionError(TextRecognitionErrorImageUnreadable,
                                      "the image could not be prepared for recognition");
    return std::nullopt;
  }

  Watch watch;
  watch.request = &request;
  double megapixels = static_cast<double>(pixGetWidth(page.pix)) * pixGetHeight(page.pix) / 1e6;
  watch.seconds = request.timeout() > 0
                      ? request.timeout()
                      : std::max(impl.options.minTimeoutSeconds,
                                 impl.options.timeoutSecondsPerMegapixel * megapixels);
  watch.deadline = std::chrono::steady_clock::now() +
                   std::chrono::duration_cast<std::chrono::steady_clock::duration>(
                       std::chrono::duration<double>(watch.seconds));
  auto read = [&](const Page& p, const std::string& m, PassSettings settings, PassResult* out,
                  Error* e) { return impl.recognisePass(p, m, settings, watch, fast, out, e); };

  // Detection needs the script before the first reading; otherwise orientation is only
  // asked about a page that reads poorly upright, or whose characters lie on their side.
  Impl::Orientation orientation;
  bool orientationAsked = false;
  std::string latin = impl.latinModels();
  bool scriptTrusted = false;
  bool enoughForOrientation =
      std::min(pixGetWidth(page.pix), pixGetHeight(page.pix)) >= kMinOrientationSide;
  // The fast level turns only pages whose characters lie on their side: the detector
  // costs less than reading such a page as it lies.
  bool mayTurn = (!fast || detect) && enoughForOrientation;
  bool sideways = enoughForOrientation && plan.sideways;
  if (detect || sideways) {
    orientation = impl.detectOrientation(page, error);
    orientationAsked = true;
  }
  bool turnedFirst = false;
  if (sideways && orientation.rotateQuadrants % 2 == 1) {
    PIX* turned = pixRotateOrth(page.pix, orientation.rotateQuadrants);
    if (turned) {
      page.replace(turned);
      page.characters.clear();
      turnedFirst = true;
    }
  }
  if (detect) {
    std::string scriptModel = modelForScript(orientation.script);
    scriptTrusted = !scriptModel.empty() && impl.isInstalled(scriptModel);
    models = scriptTrusted ? scriptModel : latin;
    if (models.empty()) models = modelForCode(impl.installedCodes.front());
  }

  PassResult result;
  PassSettings settings{plan.threshold, false, plan.lightText};
  if (!read(page, models, settings, &result, error)) {
    // Specks the adaptive threshold made of a background: read as the engine would
    // by default.
    if (watch.stop != Stop::Overgrown || settings.threshold == Threshold::Otsu) {
      return std::nullopt;
    }
    settings.threshold = Threshold::Otsu;
    plan.alternativeWorthTrying = false;
    if (!read(page, models, settings, &result, error)) return std::nullopt;
  }
  // Another reading of `candidate` with `tried`, kept when its confidence-weighted
  // characters beat the best so far by `factor` (and its mean confidence by `gain`);
  // false only when the recognition was stopped.
  auto tryAnother = [&](Page& candidate, PassSettings tried, double factor, double gain,
                        bool* kept) {
    *kept = false;
    PassResult other;
    Error failure;
    if (!read(candidate, models, tried, &other, &failure)) {
      if (!isStop(failure)) return true;
      *error = failure;
      return false;
    }
    if (other.weight > factor * result.weight &&
        other.meanConfidence() > result.meanConfidence() + gain) {
      result = std::move(other);
      settings = tried;
      *kept = true;
    }
    return true;
  };
  // A page is turned only when it reads poorly as it is, the detector is sure of
  // another orientation, and turned it reads clearly better: short codes in a table or
  // a receipt's columns fool the detector often enough. A page read turned first is
  // compared with its untouched self in the same way.
  auto tryTurning = [&] {
    if (!orientationAsked) orientation = impl.detectOrientation(page, error);
    orientationAsked = true;
    int quadrants = turnedFirst ? 4 - orientation.rotateQuadrants : orientation.rotateQuadrants;
    if (quadrants % 4 == 0) return true;
    Page turned;
    turned.replace(pixRotateOrth(page.pix, quadrants));
    turned.resolution = page.resolution;
    bool kept = false;
    if (!turned.pix) return true;
    if (!tryAnother(turned, settings, kTurnedWeight, kTurnedConfidenceGain, &kept)) return false;
    if (kept) page = std::move(turned);
    return true;
  };
  bool kept = false;
  if (mayTurn && judge(result, plan) == Reading::Unreadable && !tryTurning()) return std::nullopt;
  if (plan.alternativeWorthTrying && judge(result, plan) != Reading::Good) {
    PassSettings other = settings;
    other.threshold = settings.threshold == Threshold::Otsu ? Threshold::Sauvola : Threshold::Otsu;
    if (!tryAnother(page, other, kBetterWeight, -1, &kept)) return std::nullopt;
  }
  if (judge(result, plan) == Reading::Sparse) {
    PassSettings rows = settings;
    rows.singleBlock = true;
    if (!tryAnother(page, rows, kBetterWeight, -1, &kept)) return std::nullopt;
  }
  if (mayTurn && !orientationAsked && judge(result, plan) == Reading::Unreadable && !tryTurning()) {
    return std::nullopt;
  }
  if (!impl.rereadWeakBlocks(page, models, settings, watch, fast, &result, error) ||
      !impl.readMissedRegions(page, models, settings, watch, fast, &result, error)) {
    return std::nullopt;
  }
  if (!detect) return std::move(result.observations);

  if (models.find('+') == std::string::npos) {
    // The script's model reads the text well enough to tell its language; read again
    // with that language's own model when it is another one.
    std::string better = modelForCode(tesseract_backend::identifyLanguage(result.text));
    if (!better.empty() && better != models && impl.isInstalled(better)) {
      PassResult second;
      if (read(page, better, settings, &second, error)) {
        result = std::move(second);
      } else if (isStop(*error)) {
        return std::nullopt;
      }
    }
  }
  if (scriptTrusted && result.meanConfidence() < kMinDetectedConfidence && !latin.empty() &&
      latin != models) {
    // A weak script verdict that read poorly: the page may be Latin after all.
    PassResult fallback;
    if (read(page, latin, settings, &fallback, error)) {
      if (fallback.meanConfidence() > result.meanConfidence()) result = std::move(fallback);
    } else if (isStop(*error)) {
      return std::nullopt;
    }
  }
  return std::move(result.observations);
}

std::uint32_t TesseractRecognizer::maxUsefulLongSide(const TextRecognitionRequest& request) const {
  return request.recognitionLevel() == TextRecognitionLevelFast ? impl_->options.fastMaxLongSide
                                                                : 0;
}

TesseractRecognizer::Statistics TesseractRecognizer::statistics() const {
  std::lock_guard lock(impl_->statsMutex);
  Statistics stats = impl_->stats;
  stats.idleEngines = impl_->pool.idleCount();
  return stats;
}

void TesseractRecognizer::releaseIdleEngines() { impl_->pool.clear(); }

}  // namespace corvel
