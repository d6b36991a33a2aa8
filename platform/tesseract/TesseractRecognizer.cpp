// The Tesseract recogniser: the languages, each level's way through a page (which
// readings it takes, and which it keeps) and automatic language detection.
#include <omp.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <thread>

#include "Corvelbase/platform/TextRecognizer.h"
#include "platform/Backends.h"
#include "platform/LanguageDetection.h"
#include "platform/RecognitionLanguages.h"
#include "platform/image/BitmapNative.h"
#include "platform/tesseract/PageReader.h"
#include "platform/tesseract/TesseractStatistics.h"

namespace corvel {

using detail::judge;
using detail::measurePage;
using detail::Page;
using detail::PageBox;
using detail::PagePlan;
using detail::PageReader;
using detail::PassResult;
using detail::PassSettings;
using detail::PlanLimits;
using detail::planPage;
using detail::preparePage;
using detail::Reading;
using detail::Stop;
using detail::Threshold;
using detail::toWhole;
using detail::Watch;

namespace {

constexpr const char* kDebianDataPath = "/usr/share/tesseract-ocr/5/tessdata";

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
// A second binarisation is kept when its confidence-weighted characters exceed the
// first's by this factor; a turned page must beat the upright one by more, and by this
// much mean confidence.
constexpr double kBetterWeight = 1.05;
constexpr double kTurnedWeight = 1.3;
constexpr double kTurnedConfidenceGain = 0.1;

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
  const auto* language = detail::recognitionLanguage(code);
  return language ? language->model : "";
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
    // Reported as the recogniser always has: the Latin and Cyrillic languages first.
    for (bool eastAsian : {false, true}) {
      for (const auto& language : detail::recognitionLanguages()) {
        if (language.eastAsian == eastAsian && !language.isAlias() && isInstalled(language.model)) {
          installedCodes.push_back(language.code);
        }
      }
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

  // What a page reads with when its script cannot be trusted: the Latin languages.
  std::string latinModels() const {
    std::vector<std::string> list;
    for (const auto& language : detail::recognitionLanguages())
      if (language.latin && isInstalled(language.model)) list.push_back(language.model);
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

// One request on one page: the page prepared from its measures, a first reading, the
// readings that follow only where the first reads poorly, and, for detection, the
// language's own model. Each step answers false with *error_ when it cannot go on.
class TesseractRecognizer::PageRecognition {
 public:
  PageRecognition(Impl& impl, const TextRecognitionRequest& request, Error* error)
      : impl_(impl),
        request_(request),
        error_(error),
        fast_(request.recognitionLevel() == TextRecognitionLevelFast),
        detect_(request.recognitionLanguages().empty() && request.automaticallyDetectsLanguage()) {}

  std::optional<std::vector<RecognizedTextObservation>> run(const Bitmap& bitmap) {
    if (!chooseModels() || !prepare(bitmap)) return std::nullopt;
    startWatch();
    if (!orient() || !readFirst() || !lookAgain() || !readLanguage()) return std::nullopt;
    if (!impl_.reader.rereadWeakBlocks(page_, models_, settings_, watch_, fast_, &result_,
                                       error_) ||
        !impl_.reader.readMissedRegions(page_, models_, settings_, watch_, fast_, &result_,
                                        error_)) {
      return std::nullopt;
    }
    return uncropped();
  }

 private:
  // Boxes are normalised to the page as read; a page cut from the desk has them brought
  // back to the whole picture (the scale does not change normalised boxes). A turned
  // page keeps them in its upright frame.
  std::vector<RecognizedTextObservation> uncropped() {
    PageBox crop = plan_.crop;
    crop.w = std::min(crop.w, uncroppedWidth_ - crop.x);
    crop.h = std::min(crop.h, uncroppedHeight_ - crop.y);
    if (plan_.crop.w > 0 && crop.w > 0 && crop.h > 0 && !readTurned_) {
      for (auto& line : result_.observations) {
        line.boundingBox = toWhole(line.boundingBox, crop, uncroppedWidth_, uncroppedHeight_);
        for (auto& word : line.words) {
          word.boundingBox = toWhole(word.boundingBox, crop, uncroppedWidth_, uncroppedHeight_);
        }
      }
    }
    return std::move(result_.observations);
  }

  bool chooseModels() {
    models_ = "eng";
    return request_.recognitionLanguages().empty() ||
           impl_.modelsForCodes(request_.recognitionLanguages(), &models_, error_);
  }

  bool prepare(const Bitmap& bitmap) {
    page_ = preparePage(bitmap);
    bool prepared = page_.pix && (!fast_ || capLongSide(page_, impl_.options.fastMaxLongSide));
    if (prepared) {
      uncroppedWidth_ = pixGetWidth(page_.pix);
      uncroppedHeight_ = pixGetHeight(page_.pix);
      PlanLimits limits =
          fast_ ? PlanLimits{kFastEnlargeBelow, kFastEnlargeTo, 0, impl_.options.fastMaxLongSide}
                : PlanLimits{kEnlargeBelow, kEnlargeTo, 0, kMaxScaledLongSide};
      plan_ = planPage(measurePage(page_.pix), page_.fileResolution, limits);
      prepared = applyPlan(page_, plan_);
    }
    if (!prepared) {
      *error_ = makeTextRecognitionError(TextRecognitionErrorImageUnreadable,
                                         "the image could not be prepared for recognition");
    }
    settings_ = {plan_.threshold, false, plan_.lightText};
    return prepared;
  }

  void startWatch() {
    watch_.request = &request_;
    double megapixels = static_cast<double>(pixGetWidth(page_.pix)) * pixGetHeight(page_.pix) / 1e6;
    watch_.seconds = request_.timeout() > 0
                         ? request_.timeout()
                         : std::max(impl_.options.minTimeoutSeconds,
                                    impl_.options.timeoutSecondsPerMegapixel * megapixels);
    watch_.deadline = std::chrono::steady_clock::now() +
                      std::chrono::duration_cast<std::chrono::steady_clock::duration>(
                          std::chrono::duration<double>(watch_.seconds));
  }

  bool read(const Page& page, const std::string& models, PassSettings settings, PassResult* out,
            Error* error) {
    return impl_.reader.recognisePass(page, models, settings, watch_, fast_, out, error);
  }

  // Detection needs the script before the first reading, and a page whose characters
  // lie on their side is read turned first, as the detector says (even at the fast
  // level: the detector costs less than reading such a page as it lies). Otherwise
  // orientation is only asked about a page that reads poorly.
  bool orient() {
    bool enough = std::min(pixGetWidth(page_.pix), pixGetHeight(page_.pix)) >= kMinOrientationSide;
    mayTurn_ = (!fast_ || detect_) && enough;
    bool sideways = enough && plan_.sideways;
    if (detect_ || sideways) askOrientation();
    if (sideways && orientation_.rotateQuadrants % 2 == 1) {
      if (PIX* turned = pixRotateOrth(page_.pix, orientation_.rotateQuadrants)) {
        page_.replace(turned);
        page_.characters.clear();
        turnedFirst_ = true;
        readTurned_ = true;
      }
    }
    if (detect_) {
      latin_ = impl_.latinModels();
      std::string scriptModel = modelForScript(orientation_.script);
      scriptTrusted_ = !scriptModel.empty() && impl_.isInstalled(scriptModel);
      models_ = scriptTrusted_ ? scriptModel : latin_;
      if (models_.empty()) models_ = modelForCode(impl_.installedCodes.front());
    }
    return true;
  }

  void askOrientation() {
    if (orientationAsked_) return;
    orientation_ = impl_.reader.detectOrientation(page_, error_);
    orientationAsked_ = true;
  }

  bool readFirst() {
    if (read(page_, models_, settings_, &result_, error_)) return true;
    // Specks the adaptive threshold made of a background: read as the engine would by
    // default.
    if (watch_.stop != Stop::Overgrown || settings_.threshold == Threshold::Otsu) return false;
    settings_.threshold = Threshold::Otsu;
    plan_.alternativeWorthTrying = false;
    return read(page_, models_, settings_, &result_, error_);
  }

  // Another reading of `candidate` with `tried`, kept when its confidence-weighted
  // characters beat the best so far by `factor` and its mean confidence by `gain`;
  // false only when the recognition was stopped.
  bool tryAnother(const Page& candidate, PassSettings tried, double factor, double gain,
                  bool* kept) {
    *kept = false;
    PassResult other;
    Error failure;
    if (!read(candidate, models_, tried, &other, &failure)) {
      if (!isStop(failure)) return true;
      *error_ = failure;
      return false;
    }
    if (other.weight > factor * result_.weight &&
        other.meanConfidence() > result_.meanConfidence() + gain) {
      result_ = std::move(other);
      settings_ = tried;
      *kept = true;
    }
    return true;
  }

  // A page is turned only when it reads poorly as it is, the detector is sure of another
  // orientation, and turned it reads clearly better: short codes in a table or a
  // receipt's columns fool the detector often enough. A page read turned first is
  // compared with its untouched self in the same way.
  bool tryTurning() {
    askOrientation();
    int quadrants = turnedFirst_ ? 4 - orientation_.rotateQuadrants : orientation_.rotateQuadrants;
    if (quadrants % 4 == 0) return true;
    Page turned;
    turned.replace(pixRotateOrth(page_.pix, quadrants));
    turned.resolution = page_.resolution;
    bool kept = false;
    if (!turned.pix) return true;
    if (!tryAnother(turned, settings_, kTurnedWeight, kTurnedConfidenceGain, &kept)) return false;
    if (kept) {
      page_ = std::move(turned);
      readTurned_ = !readTurned_;
    }
    return true;
  }

  // Only where the reading so far is poor: turned (when it is unreadable), with the
  // other binarisation, as one block of rows (when it finds far fewer characters than the
  // page shows), and turned after all.
  bool lookAgain() {
    bool kept = false;
    if (mayTurn_ && judge(result_, plan_) == Reading::Unreadable && !tryTurning()) return false;
    if (plan_.alternativeWorthTrying && judge(result_, plan_) != Reading::Good) {
      PassSettings other = settings_;
      other.threshold =
          settings_.threshold == Threshold::Otsu ? Threshold::Sauvola : Threshold::Otsu;
      if (!tryAnother(page_, other, kBetterWeight, -1, &kept)) return false;
    }
    if (judge(result_, plan_) == Reading::Sparse) {
      PassSettings rows = settings_;
      rows.singleBlock = true;
      if (!tryAnother(page_, rows, kBetterWeight, -1, &kept)) return false;
    }
    if (mayTurn_ && !orientationAsked_ && judge(result_, plan_) == Reading::Unreadable) {
      return tryTurning();
    }
    return true;
  }

  // Detection: the script's model reads the text well enough to tell its language; the
  // page is read again with that language's own model when it is another one, and with
  // the Latin languages when a weak script verdict read poorly.
  bool readLanguage() {
    if (!detect_) return true;
    if (models_.find('+') == std::string::npos) {
      auto identified = detail::identifyReliably(result_.text);
      const auto* language =
          identified ? detail::recognitionLanguageIdentifiedAs(*identified) : nullptr;
      std::string better = language ? language->model : "";
      if (!better.empty() && better != models_ && impl_.isInstalled(better)) {
        PassResult second;
        Error failure;
        if (read(page_, better, settings_, &second, &failure)) {
          result_ = std::move(second);
          models_ = better;
        } else if (isStop(failure)) {
          *error_ = failure;
          return false;
        }
      }
    }
    if (scriptTrusted_ && result_.meanConfidence() < kMinDetectedConfidence && !latin_.empty() &&
        latin_ != models_) {
      PassResult fallback;
      Error failure;
      if (read(page_, latin_, settings_, &fallback, &failure)) {
        if (fallback.meanConfidence() > result_.meanConfidence()) {
          result_ = std::move(fallback);
          models_ = latin_;
        }
      } else if (isStop(failure)) {
        *error_ = failure;
        return false;
      }
    }
    return true;
  }

  Impl& impl_;
  const TextRecognitionRequest& request_;
  Error* error_;
  bool fast_, detect_;
  std::string models_, latin_;
  Page page_;
  PagePlan plan_;
  PassSettings settings_;
  Watch watch_;
  PassResult result_;
  PageReader::Orientation orientation_;
  bool orientationAsked_ = false, turnedFirst_ = false, mayTurn_ = false, scriptTrusted_ = false;
  bool readTurned_ = false;  // the page read is the picture turned
  int uncroppedWidth_ = 0, uncroppedHeight_ = 0;
};

std::optional<std::vector<RecognizedTextObservation>> TesseractRecognizer::recognize(
    const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) {
  keepEngineOnThisThread();
  return PageRecognition(*impl_, request, error).run(bitmap);
}

std::uint32_t TesseractRecognizer::maxUsefulLongSide(const TextRecognitionRequest& request) const {
  return request.recognitionLevel() == TextRecognitionLevelFast ? impl_->options.fastMaxLongSide
                                                                : 0;
}

struct TesseractRecognizerAccess {
  static const TesseractRecognizer::Impl& impl(const TesseractRecognizer& recognizer) {
    return *recognizer.impl_;
  }
};

detail::TesseractStatistics detail::tesseractStatistics(const TesseractRecognizer& recognizer) {
  return TesseractRecognizerAccess::impl(recognizer).reader.statistics();
}

void TesseractRecognizer::releaseIdleEngines() { impl_->reader.pool().clear(); }

// This backend is the registry's default recogniser.
std::shared_ptr<TextRecognizer> detail::makeDefaultTextRecognizer() {
  return TesseractRecognizer::init();
}

}  // namespace corvel
