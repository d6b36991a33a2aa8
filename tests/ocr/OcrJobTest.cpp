// Recognition jobs with the scripted recogniser: request settings per platform version,
// observations to blocks, delivery on the main queue, errors, cancelling, the queue's
// limit.
#include <gtest/gtest.h>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "support/FakeRecognizer.h"
#include "support/ManualDispatcher.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

using namespace std::chrono_literals;
using Codes = std::vector<std::string>;
using Start = std::function<std::shared_ptr<RVVisionOCR>(RVVisionOCR::Completion)>;

struct Delivery {
  int calls = 0;
  String text;
  std::optional<Error> error;
  std::thread::id thread;
};

RVVisionOCR::Completion recordInto(Delivery* delivery) {
  return [delivery](const String& text, const std::optional<Error>& error) {
    ++delivery->calls;
    delivery->text = text;
    delivery->error = error;
    delivery->thread = std::this_thread::get_id();
  };
}

std::shared_ptr<Bitmap> whitePage() {
  Data rgba(40 * 30 * 4, 255);
  return Bitmap::fromRGBA(40, 30, rgba.data(), rgba.size());
}

RecognizedTextObservation line(const char* text, float confidence, Rect box) {
  return {box, {{fromUTF8(text), confidence}}};
}

class OcrJob : public ::testing::Test {
 protected:
  void SetUp() override {
    PlatformRegistry::setTextRecognizer(fake_);
    PlatformRegistry::setMainQueueDispatcher(main_);
  }
  void TearDown() override {
    fake_->release();
    settle();
    PlatformRegistry::setTextRecognizer(nullptr);
    PlatformRegistry::setMainQueueDispatcher(nullptr);
    PlatformRegistry::setPlatformVersion({});
  }
  // Waits for the job's work, then delivers what it sent to the main queue.
  void finish(const std::shared_ptr<RVVisionOCR>& job) {
    ASSERT_TRUE(job->ocrOperation());
    job->ocrOperation()->waitUntilFinished();
    main_->drain();
  }
  void settle() {
    RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
    main_->drain();
  }
  std::shared_ptr<RVVisionOCR> startBlank(Delivery* delivery) {
    return RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(delivery));
  }

  std::shared_ptr<testing::FakeRecognizer> fake_ = std::make_shared<testing::FakeRecognizer>();
  std::shared_ptr<testing::ManualDispatcher> main_ = std::make_shared<testing::ManualDispatcher>();
};

TEST_F(OcrJob, RequestSettingsFollowThePlatformVersion) {
  struct Case {
    const char* name;
    PlatformVersion version;
    Codes codes;
    bool fast;
    std::optional<std::int64_t> revision;
    Codes languages;
    bool detect;
  } cases[] = {
      // with no codes the newest systems detect the language, older ones read English
      {"newest, fast", {}, {}, true, 3, {}, true},
      {"13", {13, 0, 0}, {}, false, 3, {}, true},
      {"12, fast", {12, 6, 0}, {}, true, 2, {"en-US"}, false},
      {"10.15", {10, 15, 0}, {}, false, std::nullopt, {"en-US"}, false},
      // given codes are passed on, the forced-primary one first
      {"newest, French and Japanese", {}, {"fr-FR", "ja-JP"}, false, 3, {"ja-JP", "fr-FR"}, false},
      {"11, three",
       {11, 0, 0},
       {"en-US", "ko-KR", "ja-JP"},
       true,
       2,
       {"ko-KR", "en-US", "ja-JP"},
       false},
  };
  for (const auto& c : cases) {
    auto recorder = std::make_shared<testing::FakeRecognizer>();
    PlatformRegistry::setTextRecognizer(recorder);
    PlatformRegistry::setPlatformVersion(c.version);
    Delivery delivery;
    finish(RVVisionOCR::ocrCGImage(whitePage(), c.codes, c.fast, recordInto(&delivery)));
    ASSERT_EQ(recorder->requests().size(), 1u) << c.name;
    const auto request = recorder->requests()[0];
    EXPECT_EQ(request.revision, c.revision) << c.name;
    EXPECT_TRUE(request.usesLanguageCorrection) << c.name;
    EXPECT_EQ(request.recognitionLevel, c.fast ? 1 : 0) << c.name;
    EXPECT_EQ(request.languages, c.languages) << c.name;
    EXPECT_EQ(request.automaticallyDetectsLanguage, c.detect) << c.name;
    EXPECT_EQ(request.width, 40u);
    EXPECT_EQ(request.height, 30u);
    EXPECT_EQ(delivery.calls, 1) << c.name;
  }
}

TEST_F(OcrJob, EachObservationsBestReadingBecomesALineBlock) {
  RecognizedTextObservation twoReadings{Rect(0.1, 0.5, 0.3, 0.05),
                                        {{u"best", 0.75f}, {u"second", 0.9f}}};
  RecognizedTextObservation noReading{Rect(0.1, 0.3, 0.3, 0.05), {}};
  fake_->setObservations({line("half sure", 0.5f, Rect(0.1, 0.2, 0.3, 0.05)), twoReadings,
                          noReading, line("", 0.25f, Rect(2, -1, 0, 0))});
  Delivery delivery;
  auto job = startBlank(&delivery);
  finish(job);
  ASSERT_EQ(delivery.calls, 1);
  EXPECT_FALSE(delivery.error);
  const auto& blocks = *job->layoutAnalyser()->textBlocks();
  ASSERT_EQ(blocks.size(), 3u);  // the observation without a reading adds nothing
  struct Expected {
    const char16_t* text;
    double confidence;
    Rect box;
  } expected[] = {{u"half sure", 50.0, Rect(0.1, 0.2, 0.3, 0.05)},
                  {u"best", 75.0, Rect(0.1, 0.5, 0.3, 0.05)},
                  {u"", 25.0, Rect(2, -1, 0, 0)}};  // no filtering of any kind
  for (std::size_t i = 0; i < 3; ++i) {
    EXPECT_EQ(blocks[i]->text(), std::optional<String>(expected[i].text)) << i;
    EXPECT_EQ(blocks[i]->confidence(), expected[i].confidence) << i;
    EXPECT_EQ(blocks[i]->boundingBox(), expected[i].box) << i;
    EXPECT_EQ(blocks[i]->level(), RVRecognitionBlockLevelLine) << i;
  }
  // The completion gets the analyser's reading-order text, analysed.
  EXPECT_TRUE(job->layoutAnalyser()->layoutBlocks());
  EXPECT_EQ(delivery.text, job->layoutAnalyser()->text());
  EXPECT_NE(delivery.text.find(u"best"), String::npos);
  EXPECT_NE(delivery.text.find(u"half sure"), String::npos);
}

TEST_F(OcrJob, TheCompletionRunsOnTheMainQueueAndTheJobAndImageAreLetGoThere) {
  fake_->setObservations({line("hello", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  auto page = whitePage();
  std::weak_ptr<Bitmap> image = page;
  Delivery delivery, other;
  // The class form returns a new job that runs without its handle.
  std::weak_ptr<RVVisionOCR> job =
      RVVisionOCR::ocrCGImage(std::move(page), {"en-US"}, true, recordInto(&delivery));
  EXPECT_NE(job.lock(), startBlank(&other));
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(delivery.calls, 0);
  EXPECT_EQ(main_->pending(), 2u);
  EXPECT_FALSE(image.expired() || job.expired());  // held until delivery
  main_->drain();
  EXPECT_EQ(delivery.calls, 1);
  EXPECT_EQ(delivery.thread, std::this_thread::get_id());
  EXPECT_EQ(delivery.text, u"hello");
  EXPECT_EQ(other.text, u"hello");
  EXPECT_TRUE(image.expired() && job.expired());
  // The instance form starts the job it is sent to.
  auto instance = RVVisionOCR::init();
  instance->startOcrCGImage(whitePage(), {}, false, recordInto(&other));
  finish(instance);
  EXPECT_EQ(other.calls, 2);
}

TEST_F(OcrJob, ARecogniserErrorReachesTheCompletionUnchangedAndIsLogged) {
  testing::LogCapture log;
  Error failure = makeTextRecognitionError(TextRecognitionErrorEngineFailure, "it broke");
  fake_->setFailure(failure);
  fake_->setObservations({line("never", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  Delivery delivery;
  auto job = startBlank(&delivery);
  finish(job);
  ASSERT_EQ(delivery.calls, 1);
  EXPECT_EQ(delivery.text, u"");
  EXPECT_EQ(delivery.error, failure);
  EXPECT_TRUE(job->layoutAnalyser()->textBlocks()->empty());
  EXPECT_EQ(log.lines(), (std::vector<std::string>{"Error: " + failure.description()}));
}

TEST_F(OcrJob, EveryBadImageEndsInAnErrorSayingWhatWentWrong) {
  testing::TempDir dir;
  auto png = readFile(testing::fixturePath("ocr/one-column.png")).value();
  auto write = [&](const std::string& name, const Data& bytes) {
    EXPECT_TRUE(writeFileAtomically(dir.file(name), bytes));
    return dir.file(name);
  };
  auto atPath = [](const std::string& path) -> Start {
    return
        [path](auto done) { return RVVisionOCR::ocrImageAtPath(fromUTF8(path), {}, false, done); };
  };
  auto atURL = [](const std::string& url) -> Start {
    return [url](auto done) { return RVVisionOCR::ocrImageAtURL(url, {}, false, done); };
  };
  Data truncated(png.begin(), png.begin() + static_cast<std::ptrdiff_t>(png.size() / 3));
  Data noPixels = png, huge = png;  // PNG headers claiming 0 x 0 and 30000 x 30000 pixels
  for (std::size_t i = 16; i < 24; ++i) noPixels[i] = 0, huge[i] = (i % 4 == 2) ? 0x75 : 0;
  huge[19] = huge[23] = 0x30;
  std::string text = "a note, not a picture";
  struct Case {
    const char* name;
    Start start;
    const char* reasonWord;
  } cases[] = {
      {"missing file", atPath(dir.file("nothing.png")), "cannot be read"},
      {"empty path", atPath(""), "no file"},
      {"truncated PNG", atPath(write("t.png", truncated)), "corrupt"},
      {"zero-byte file", atPath(write("z.png", {})), "not an image"},
      {"no pixels", atPath(write("n.png", noPixels)), "PNG"},
      {"beyond the pixel budget", atPath(write("h.png", huge)), "too large"},
      {"text file", atPath(write("note.txt", Data(text.begin(), text.end()))), "not an image"},
      {"web URL", atURL("https://example.invalid/p.png"), "https"},
      {"file URL of a missing file", atURL("file:///no/such/page.png"), "cannot be read"},
      {"null image", [](auto done) { return RVVisionOCR::ocrImage(nullptr, {}, false, done); },
       "no image"},
      {"null bitmap", [](auto done) { return RVVisionOCR::ocrCGImage(nullptr, {}, false, done); },
       "no image"},
  };
  testing::LogCapture log;
  for (const auto& c : cases) {
    Delivery delivery;
    finish(c.start(recordInto(&delivery)));
    ASSERT_EQ(delivery.calls, 1) << c.name;
    EXPECT_EQ(delivery.text, u"") << c.name;
    ASSERT_TRUE(delivery.error) << c.name;
    EXPECT_EQ(delivery.error->domain, TextRecognitionErrorDomain) << c.name;
    EXPECT_EQ(delivery.error->code, TextRecognitionErrorImageUnreadable) << c.name;
    EXPECT_NE(delivery.error->userInfoString("Error reason").find(c.reasonWord), std::string::npos)
        << c.name << ": " << delivery.error->userInfoString("Error reason");
  }
  EXPECT_TRUE(fake_->requests().empty());  // the recogniser never saw a bad image
  EXPECT_EQ(log.lines().size(), std::size(cases));
}

TEST_F(OcrJob, WithoutTextRecognitionTheJobEndsAtOnceWithTheUnsupportedError) {
  struct Case {
    const char* name;
    PlatformVersion version;
    bool recognizerAvailable;
  } cases[] = {{"10.14", {10, 14, 6}, true}, {"no language data", {}, false}};
  Error unsupported{
      "com.corvelworks.ocr",
      200,
      {{"Error reason",
        PropertyList(u"Vision OCR not support on this version of operating system")}}};
  for (const auto& c : cases) {
    PlatformRegistry::setPlatformVersion(c.version);
    fake_->setAvailable(c.recognizerAvailable);
    Delivery delivery;
    auto job =
        RVVisionOCR::ocrImageAtPath(u"/no/such/file.png", {"en-US"}, false, recordInto(&delivery));
    ASSERT_EQ(delivery.calls, 1) << c.name;  // synchronously, on this thread
    EXPECT_EQ(delivery.thread, std::this_thread::get_id());
    EXPECT_EQ(delivery.text, u"");
    EXPECT_EQ(delivery.error, unsupported);
    EXPECT_FALSE(job->ocrOperation()) << c.name;
    EXPECT_FALSE(job->layoutAnalyser()) << c.name;
    job->cancelOCRJob();  // nothing to cancel
    // Without a completion there is nothing to report to.
    RVVisionOCR::ocrCGImage(whitePage(), {}, false, nullptr);
  }
  EXPECT_EQ(main_->pending(), 0u);
  EXPECT_TRUE(fake_->requests().empty());
}

TEST_F(OcrJob, SixRunAtOnceAndCancelAllSkipsTheWaitingOnes) {
  fake_->hold();
  std::vector<Delivery> deliveries(9);
  std::vector<std::shared_ptr<RVVisionOCR>> jobs;
  for (auto& delivery : deliveries) jobs.push_back(startBlank(&delivery));
  ASSERT_TRUE(fake_->waitForRunning(6, 10s));
  EXPECT_FALSE(fake_->waitForRunning(7, 100ms));
  RVVisionOCR::cancelAllOCRJobs();
  fake_->release();
  settle();
  EXPECT_EQ(fake_->maxRunning(), 6u);
  for (std::size_t i = 0; i < 9; ++i) EXPECT_EQ(deliveries[i].calls, i < 6 ? 1 : 0) << i;
}

TEST_F(OcrJob, AJobCancelledBeforeItStartsNeverCallsItsCompletion) {
  fake_->hold();
  std::vector<Delivery> running(6);
  std::vector<std::shared_ptr<RVVisionOCR>> jobs;
  for (auto& delivery : running) jobs.push_back(startBlank(&delivery));
  ASSERT_TRUE(fake_->waitForRunning(6, 10s));
  Delivery cancelled, alsoCancelled, kept;
  auto waiting = startBlank(&cancelled);
  auto waitingToo = startBlank(&alsoCancelled);
  auto next = startBlank(&kept);
  waiting->cancelOCRJob();
  waiting->cancelOCRJob();         // twice: no harm
  waitingToo->setCancelOCR(true);  // only a flag: changes nothing
  waitingToo->cancelOCRJob();
  jobs[0]->cancelOCRJob();  // running: goes on
  fake_->release();
  settle();
  EXPECT_EQ(cancelled.calls, 0);
  EXPECT_EQ(alsoCancelled.calls, 0);
  EXPECT_EQ(kept.calls, 1);
  for (const auto& delivery : running) EXPECT_EQ(delivery.calls, 1);
  EXPECT_EQ(fake_->requests().size(), 7u);
  // After the job finished, cancelling leaves it as it was.
  next->cancelOCRJob();
  EXPECT_FALSE(next->ocrOperation()->isCancelled());
  EXPECT_TRUE(waiting->cancelOCR() == false && waitingToo->cancelOCR());
}

}  // namespace
}  // namespace corvel
