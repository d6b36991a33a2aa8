// The Tesseract recogniser: the languages, each level's way through a page (which
// readings it takes, and which it keeps) and automatic language detection.
#include <omp.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <thread>

#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/image/BitmapNative.h"
#include "platform/tesseract/LanguageIdentification.h"
#include "platform/tesseract/PageReader.h"

namespace corvel {

using tesseract_backend::judge;
using tesseract_backend::measurePage;
using tesseract_backend::Page;
using tesseract_backend::PagePlan;
using tesseract_backend::PageReader;
using tesseract_backend::PassResult;
using tesseract_backend::PassSettings;
using tesseract_backend::PlanLimits;
using tesseract_backend::planPage;
using tesseract_backend::preparePage;
using tesseract_backend::Reading;
using tesseract_backend::Stop;
using tesseract_backend::Threshold;
using tesseract_backend::Watch;

namespace {

constexpr const char* kDebianDataPath = "/usr/share/tesseract-ocr/5/tessdata";

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

}  // namespace

struct TesseractRecognizer::Impl {
  Options options;
  PageReader reader;
  bool available = false;
  std::vector<std::string> installedCodes;  // in our order

  Impl(Options o, std::string dataPath)
      : options(o),
        reader(std::move(dataPath), o.maxIdleModelBytes,
               o.maxConcurrentRecognitions ? o.maxConcurrentRecognitions
                                           : std::max(1u, std::thread::hardware_concurrency())) {
    for (const auto& entry : kLanguages) {
      if (isInstalled(entry.model)) installedCodes.push_back(entry.code);
    }
    available = !installedCodes.empty();
  }

  bool isInstalled(const std::string& model) const { return reader.pool().modelBytes(model) > 0; }

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
        "no Tesseract language data is installed in " + impl_->reader.pool().dataPath());
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
                  Error* e) {
    return impl.reader.recognisePass(p, m, settings, watch, fast, out, e);
  };

  // Detection needs the script before the first reading; otherwise orientation is only
  // asked about a page that reads poorly upright, or whose characters lie on their side.
  PageReader::Orientation orientation;
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
    orientation = impl.reader.detectOrientation(page, error);
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
    if (!orientationAsked) orientation = impl.reader.detectOrientation(page, error);
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
  if (!impl.reader.rereadWeakBlocks(page, models, settings, watch, fast, &result, error) ||
      !impl.reader.readMissedRegions(page, models, settings, watch, fast, &result, error)) {
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
  return impl_->reader.statistics();
}

void TesseractRecognizer::releaseIdleEngines() { impl_->reader.pool().clear(); }

}  // namespace corvel
