// The Tesseract recogniser: page preparation, engine settings per level, automatic
// language detection and the conversion of Tesseract's lines into observations.
#include <omp.h>
#include <tesseract/resultiterator.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <thread>

#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/image/BitmapNative.h"
#include "platform/tesseract/EnginePool.h"
#include "platform/tesseract/LanguageIdentification.h"

namespace corvel {

using tesseract_backend::Engine;
using tesseract_backend::EngineKey;
using tesseract_backend::EnginePool;

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
// Resolutions believed from a file, and the one assumed otherwise.
constexpr int kMinResolution = 70, kMaxResolution = 2400, kDefaultResolution = 300;

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
  int resolution = kDefaultResolution;

  void replace(PIX* replacement) {
    owned.reset(replacement);
    pix = replacement;
  }
};

// The page for `bitmap`, or a page without pixels when preparing it fails.
Page preparePage(const Bitmap& bitmap) {
  Page page;
  page.pix = bitmap.native().pix;
  int resolution = pixGetXRes(page.pix);
  // Resolutions outside the range are missing or nonsense in the file.
  if (resolution >= kMinResolution && resolution <= kMaxResolution) page.resolution = resolution;
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
  page.resolution = std::max(1, static_cast<int>(static_cast<float>(page.resolution) * scale));
  return true;
}

struct PassResult {
  std::vector<RecognizedTextObservation> observations;
  std::string text;  // all lines, for language identification
};

double meanConfidence(const PassResult& result) {
  if (result.observations.empty()) return 0;
  double sum = 0;
  for (const auto& observation : result.observations) sum += observation.candidates[0].confidence;
  return sum / static_cast<double>(result.observations.size());
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

  bool recognisePass(const Page& page, const std::string& models,
                     const TextRecognitionRequest& request, bool fast, PassResult* out,
                     Error* error) {
    EngineKey key{models, request.usesLanguageCorrection()};
    bool recognised = false;
    auto recognise = [&](tesseract::TessBaseAPI& api) {
      // Only the automatic segmentation keeps the columns of a page apart.
      api.SetPageSegMode(tesseract::PSM_AUTO);
      // Sauvola's adaptive threshold keeps the text of unevenly lit pages.
      api.SetVariable("thresholding_method", "2");
      // Reading every poor line a second time inverted costs the fast level too much.
      api.SetVariable("tessedit_do_invert", fast ? "0" : "1");
      api.SetImage(page.pix);
      api.SetSourceResolution(page.resolution);
      recognised = api.Recognize(nullptr) == 0;
      return recognised;
    };
    auto collect = [&](tesseract::TessBaseAPI& api) { collectLines(api, page.pix, out); };
    bool started = withEngine(key, error, recognise, collect);
    if (started && !recognised) {
      *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure,
                                        "the recognition engine failed on the image");
    }
    return started && recognised;
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
    do {
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
  if (!page.pix || (fast && !capLongSide(page, impl.options.fastMaxLongSide))) {
    *error = makeTextRecognitionError(TextRecognitionErrorImageUnreadable,
                                      "the image could not be prepared for recognition");
    return std::nullopt;
  }

  // Accurate reads pages turned on their side too; detection needs the script anyway.
  // Orientation needs a few lines of text to judge: a strip of a line or two is read
  // as it comes.
  Impl::Orientation orientation;
  bool enoughForOrientation =
      std::min(pixGetWidth(page.pix), pixGetHeight(page.pix)) >= kMinOrientationSide;
  if ((!fast && enoughForOrientation) || detect) {
    orientation = impl.detectOrientation(page, error);
    if (orientation.rotateQuadrants != 0) {
      PIX* upright = pixRotateOrth(page.pix, orientation.rotateQuadrants);
      if (upright) page.replace(upright);
    }
  }
  std::string latin = impl.latinModels();
  bool scriptTrusted = false;
  if (detect) {
    std::string scriptModel = modelForScript(orientation.script);
    scriptTrusted = !scriptModel.empty() && impl.isInstalled(scriptModel);
    models = scriptTrusted ? scriptModel : latin;
    if (models.empty()) models = modelForCode(impl.installedCodes.front());
  }

  PassResult result;
  if (!impl.recognisePass(page, models, request, fast, &result, error)) return std::nullopt;
  if (!detect) return std::move(result.observations);

  if (models.find('+') == std::string::npos) {
    // The script's model reads the text well enough to tell its language; read again
    // with that language's own model when it is another one.
    std::string better = modelForCode(tesseract_backend::identifyLanguage(result.text));
    if (!better.empty() && better != models && impl.isInstalled(better)) {
      PassResult second;
      if (impl.recognisePass(page, better, request, fast, &second, error)) {
        result = std::move(second);
      }
    }
  }
  if (scriptTrusted && meanConfidence(result) < kMinDetectedConfidence && !latin.empty() &&
      latin != models) {
    // A weak script verdict that read poorly: the page may be Latin after all.
    PassResult fallback;
    if (impl.recognisePass(page, latin, request, fast, &fallback, error) &&
        meanConfidence(fallback) > meanConfidence(result)) {
      result = std::move(fallback);
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
