// The text-recognition service: requests, the handler that performs them on an image,
// and the recogniser behind them.
//
// A `TextRecognitionRequest` carries the settings of one recognition (revision, language
// correction, level, languages, automatic language detection) and a completion handler.
// An `ImageRequestHandler` performs requests on one image synchronously on the calling
// thread: it decodes the image if needed, asks the recogniser in use
// (PlatformRegistry::textRecognizer) for the observations, stores them as the request's
// results and calls the request's handler once, with an error when anything failed.
//
// The recogniser is an interface so that a host or a test can install another engine;
// the default is `TesseractRecognizer` when Tesseract's language data is installed.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// The domain of the errors the recognition service reports; the user-info key
// "Error reason" holds a sentence saying what went wrong.
CORVEL_EXPORT extern const char* const TextRecognitionErrorDomain;
CORVEL_EXPORT extern const char* const TextRecognitionErrorReasonKey;
enum TextRecognitionErrorCode : std::int64_t {
  TextRecognitionErrorImageUnreadable = 1,  // no image, or it cannot be decoded
  TextRecognitionErrorUnsupportedLanguage = 2,
  TextRecognitionErrorEngineFailure = 3,  // the engine could not start or recognise
  TextRecognitionErrorNoRecognizer = 4,
  TextRecognitionErrorTimedOut = 5,   // the recognition ran past its deadline
  TextRecognitionErrorCancelled = 6,  // the request's cancellation check said stop
};
CORVEL_EXPORT Error makeTextRecognitionError(std::int64_t code, const std::string& reason);

// Recognition levels: accurate takes its time, fast trades some accuracy for speed.
enum TextRecognitionLevel : std::int64_t {
  TextRecognitionLevelAccurate = 0,
  TextRecognitionLevelFast = 1,
};

// One reading of a text line: the string and the recogniser's confidence, 0 to 1.
struct RecognizedText {
  String string;
  float confidence = 0;
};

// One word of a line's best reading: its text, its box (normalised like the line's) and
// the recogniser's confidence in it, 0 to 1.
struct RecognizedWord {
  String string;
  Rect boundingBox;
  float confidence = 0;
};

// A recognised text line: its box normalised to the image (0 to 1 on both axes, origin
// at the bottom left, y growing upwards) and its readings, best first.
struct CORVEL_EXPORT RecognizedTextObservation {
  Rect boundingBox;
  std::vector<RecognizedText> candidates;
  // Where the engine placed the line: the number of its block and of its paragraph in
  // the engine's reading order, counted from 0 over the page. Lines of one paragraph
  // share both; an engine that does not group lines gives every line its own paragraph.
  std::size_t block = 0;
  std::size_t paragraph = 0;
  // The words of the best reading, left to right; empty when the recogniser does not
  // tell words apart. Word boxes lie inside the line's box.
  std::vector<RecognizedWord> words{};

  // The first `maxCandidateCount` readings (all of them when there are fewer).
  std::vector<RecognizedText> topCandidates(std::size_t maxCandidateCount) const;
};

class CORVEL_EXPORT TextRecognitionRequest {
 public:
  using CompletionHandler =
      std::function<void(TextRecognitionRequest& request, const std::optional<Error>& error)>;

  // A request without a handler (used to ask for the supported languages).
  static std::shared_ptr<TextRecognitionRequest> init();
  static std::shared_ptr<TextRecognitionRequest> initWithCompletionHandler(
      CompletionHandler handler);

  // nullopt until set: the recogniser's default revision.
  void setRevision(std::int64_t revision) { revision_ = revision; }
  std::optional<std::int64_t> revision() const { return revision_; }
  void setUsesLanguageCorrection(bool on) { usesLanguageCorrection_ = on; }
  bool usesLanguageCorrection() const { return usesLanguageCorrection_; }
  // TextRecognitionLevel; other values are treated as accurate.
  void setRecognitionLevel(std::int64_t level) { recognitionLevel_ = level; }
  std::int64_t recognitionLevel() const { return recognitionLevel_; }
  // Language codes such as "en-US", most important first; empty until set.
  void setRecognitionLanguages(std::vector<std::string> codes) { languages_ = std::move(codes); }
  const std::vector<std::string>& recognitionLanguages() const { return languages_; }
  void setAutomaticallyDetectsLanguage(bool on) { automaticallyDetectsLanguage_ = on; }
  bool automaticallyDetectsLanguage() const { return automaticallyDetectsLanguage_; }
  // The longest a perform may take, in seconds; past it the perform fails with
  // TextRecognitionErrorTimedOut. 0 (the default) leaves it to the recogniser, which
  // must still bound every recognition.
  void setTimeout(double seconds) { timeout_ = seconds; }
  double timeout() const { return timeout_; }
  // Asked now and then while a perform runs, on the performing thread; when it answers
  // true the engine stops and the perform fails with TextRecognitionErrorCancelled.
  // Must be cheap and thread-safe (it typically reads an atomic flag another thread sets).
  void setCancellationCheck(std::function<bool()> check) { cancellationCheck_ = std::move(check); }
  bool isCancelled() const { return cancellationCheck_ && cancellationCheck_(); }

  // The observations of the last perform; nullopt before one and after a failure.
  const std::optional<std::vector<RecognizedTextObservation>>& results() const { return results_; }
  void setResults(std::optional<std::vector<RecognizedTextObservation>> results) {
    results_ = std::move(results);
  }
  const CompletionHandler& completionHandler() const { return handler_; }

  // The codes the recogniser in use supports at this request's level, in its own order;
  // nullopt with *error (if given) when it cannot say or no recogniser is available.
  std::optional<std::vector<std::string>> supportedRecognitionLanguages(Error* error) const;
  static std::optional<std::vector<std::string>>
  supportedRecognitionLanguagesForTextRecognitionLevel(std::int64_t level, std::int64_t revision,
                                                       Error* error);

 private:
  TextRecognitionRequest() = default;

  CompletionHandler handler_;
  std::optional<std::int64_t> revision_;
  bool usesLanguageCorrection_ = true;
  std::int64_t recognitionLevel_ = TextRecognitionLevelAccurate;
  std::vector<std::string> languages_;
  bool automaticallyDetectsLanguage_ = false;
  double timeout_ = 0;
  std::function<bool()> cancellationCheck_;
  std::optional<std::vector<RecognizedTextObservation>> results_;
};

// The engine behind the requests. Implementations must allow `recognize` from several
// threads at once.
class CORVEL_EXPORT TextRecognizer {
 public:
  virtual ~TextRecognizer();

  // False when the recogniser cannot recognise anything here (no language data): jobs
  // then end as on a system without text recognition.
  virtual bool isAvailable() const { return true; }
  // Recognises the text of `bitmap` with the request's settings, synchronously on the
  // calling thread. The observations come in reading order of the engine. On failure:
  // nullopt and *error (never null) set, in TextRecognitionErrorDomain.
  virtual std::optional<std::vector<RecognizedTextObservation>> recognize(
      const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) = 0;
  // The longest side in pixels an image needs for `request`, or 0 for its full size. A
  // handler then gives `recognize` an image reduced to that, and a file-backed image is
  // reduced while it is decoded.
  virtual std::uint32_t maxUsefulLongSide(const TextRecognitionRequest& /*request*/) const {
    return 0;
  }
  // The language codes supported at `level`, in the recogniser's own order; nullopt
  // and *error (never null) when it cannot say.
  virtual std::optional<std::vector<std::string>> supportedRecognitionLanguages(
      std::int64_t level, std::int64_t revision, Error* error) = 0;
};

// Performs requests on one image.
class CORVEL_EXPORT ImageRequestHandler {
 public:
  // On decoded pixels; a null bitmap makes every perform fail with
  // TextRecognitionErrorImageUnreadable. `options` are accepted and unused.
  static std::shared_ptr<ImageRequestHandler> initWithCGImage(std::shared_ptr<Bitmap> image,
                                                              PropertyList::Dictionary options);
  // On an image that is decoded when a request is first performed (so on the thread that
  // performs it); a failure to decode is reported with the image's failure reason.
  static std::shared_ptr<ImageRequestHandler> initWithImage(std::shared_ptr<Image> image,
                                                            PropertyList::Dictionary options);

  // Performs each request in turn: its results are set and its handler is called once,
  // with the error when it failed. Returns false, with the first failure in *error (if
  // given), when any request failed.
  bool performRequests(const std::vector<std::shared_ptr<TextRecognitionRequest>>& requests,
                       Error* error);

 private:
  ImageRequestHandler() = default;
  std::shared_ptr<Bitmap> bitmap_;
  std::shared_ptr<Image> image_;
};

// The Tesseract engine. Thread-safe: recognitions on several threads share a pool of
// started engines (one engine per recognition at a time, keyed by languages and mode),
// and at most `maxConcurrentRecognitions` run at once, since more recognitions than
// cores only slow each other down.
//
// Each page is prepared from what it shows (measured on a reduced grey copy): the
// binarisation is the engine's global Otsu unless an adaptive threshold (Sauvola) finds
// clearly more text without losing light-on-dark letters or turning a textured ground
// into specks, as on unevenly lit photographs; text under 12 pixels (10 at the fast
// level) is enlarged to 15 (14) and the engine is told the resolution the text height
// suggests, unless the file states one close to it; a photographed sheet is cut from
// the desk around it. A pass that reads poorly (low confidence, or far fewer
// characters than the page shows) is read again with the other binarisation, or as
// one block of rows (which keeps a receipt's column of prices that the automatic
// segmentation drops), and the better reading kept.
//
// Levels: accurate reads at full resolution and, when a page still reads poorly, asks
// the orientation detector (pages with a short side of at least 300 pixels) and keeps
// the turned page only when it reads clearly better; fast does not turn pages, reads
// with the long side reduced to at most `fastMaxLongSide` pixels (a handler reduces a
// file's image while decoding it) and skips the engine's second look at poor lines.
//
// Every recognition is bounded: by the request's timeout or else the Options' deadline,
// by its cancellation check, and by a cap on the words a page may yield (specks the
// engine took for words; its paragraph step costs their square), each checked by the
// engine's progress monitor while it recognises.
//
// Languages: every code of the recognition language catalogue reads with a Tesseract
// model (modelForLanguageCode; the Cantonese codes with the Chinese ones). A code
// without a model, or whose model is not installed, fails the recognition with
// TextRecognitionErrorUnsupportedLanguage. With automatic detection and no codes, the
// script is detected first, the page read with that script's model, the language
// identified from the text, and the page read again when the language's model differs;
// a script that cannot be trusted falls back to the Latin languages together.
class CORVEL_EXPORT TesseractRecognizer final : public TextRecognizer {
 public:
  struct Options {
    // Where the *.traineddata files are; empty: $TESSDATA_PREFIX, else Debian's folder.
    std::string dataPath;
    // Recognitions running at once; 0: the number of cores.
    unsigned maxConcurrentRecognitions = 0;
    // Idle engines are stopped, least recently used first, while the model data they
    // hold adds up to more than this many bytes (on-disk size of their models).
    std::uint64_t maxIdleModelBytes = 64ull << 20;
    // The fast level's cap on the long side of the image, in pixels.
    std::uint32_t fastMaxLongSide = 2200;
    // The deadline of a request without its own timeout: this many seconds per
    // megapixel of the page as recognised, and never less than the minimum.
    double timeoutSecondsPerMegapixel = 10;
    double minTimeoutSeconds = 60;
  };

  static std::shared_ptr<TesseractRecognizer> init(Options options);
  static std::shared_ptr<TesseractRecognizer> init() { return init(Options()); }
  ~TesseractRecognizer() override;

  bool isAvailable() const override;
  std::optional<std::vector<RecognizedTextObservation>> recognize(
      const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) override;
  // `fastMaxLongSide` for the fast level; accurate reads at full resolution.
  std::uint32_t maxUsefulLongSide(const TextRecognitionRequest& request) const override;
  std::optional<std::vector<std::string>> supportedRecognitionLanguages(std::int64_t level,
                                                                        std::int64_t revision,
                                                                        Error* error) override;

  // Stops every idle engine (running recognitions keep theirs).
  void releaseIdleEngines();
  // The Tesseract model name of a language code ("eng" for "en-US"), or "" when the code
  // has none.
  static std::string modelForLanguageCode(const std::string& code);

 private:
  struct Impl;
  class PageRecognition;
  friend struct TesseractRecognizerAccess;  // the engine's statistics, read internally
  explicit TesseractRecognizer(std::unique_ptr<Impl> impl);
  std::unique_ptr<Impl> impl_;
};

}  // namespace corvel
