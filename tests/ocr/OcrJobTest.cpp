// Recognition jobs with the scripted recogniser: request settings per platform version,
// observations to blocks, delivery on the main queue, errors, cancelling, the queue's
// limit.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

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

std::shared_ptr<Bitmap> whitePage(std::uint32_t width = 40, std::uint32_t height = 30) {
  Data rgba(static_cast<std::size_t>(width) * height * 4, 255);
  return Bitmap::fromRGBA(width, height, rgba.data(), rgba.size());
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
    RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
    main_->drain();
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
      {"newest, no codes, fast", {}, {}, true, 3, {}, true},
      {"13, no codes", {13, 0, 0}, {}, false, 3, {}, true},
      {"12, no codes", {12, 6, 0}, {}, false, 2, {"en-US"}, false},
      {"11, no codes, fast", {11, 0, 0}, {}, true, 2, {"en-US"}, false},
      {"10.15, no codes", {10, 15, 0}, {}, false, std::nullopt, {"en-US"}, false},
      {"newest, French and Japanese", {}, {"fr-FR", "ja-JP"}, false, 3, {"ja-JP", "fr-FR"}, false},
      {"12, three codes",
       {12, 0, 0},
       {"en-US", "ko-KR", "ja-JP"},
       true,
       2,
       {"ko-KR", "en-US", "ja-JP"},
       false},
      {"11, unknown code kept",
       {11, 2, 0},
       {"xx-XX", "de-DE"},
       false,
       2,
       {"xx-XX", "de-DE"},
       false},
  };
  for (const auto& c : cases) {
    auto recorder = std::make_shared<testing::FakeRecognizer>();
    PlatformRegistry::setTextRecognizer(recorder);
    PlatformRegistry::setPlatformVersion(c.version);
    Delivery delivery;
    auto job = RVVisionOCR::ocrCGImage(whitePage(), c.codes, c.fast, recordInto(&delivery));
    finish(job);
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
  auto job = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&delivery));
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

TEST_F(OcrJob, TheCompletionRunsOnTheMainQueueAndTheImageIsLetGoThere) {
  fake_->setObservations({line("hello", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  auto page = whitePage();
  std::weak_ptr<Bitmap> watch = page;
  Delivery delivery;
  auto job = RVVisionOCR::ocrCGImage(std::move(page), {"en-US"}, true, recordInto(&delivery));
  job->ocrOperation()->waitUntilFinished();
  EXPECT_EQ(delivery.calls, 0);
  EXPECT_EQ(main_->pending(), 1u);
  EXPECT_FALSE(watch.expired());  // held until delivery
  main_->drain();
  EXPECT_EQ(delivery.calls, 1);
  EXPECT_EQ(delivery.thread, std::this_thread::get_id());
  EXPECT_EQ(delivery.text, u"hello");
  EXPECT_TRUE(watch.expired());
}

TEST_F(OcrJob, ARecogniserErrorReachesTheCompletionUnchangedAndIsLogged) {
  testing::LogCapture log;
  Error failure = makeTextRecognitionError(TextRecognitionErrorEngineFailure, "it broke");
  fake_->setFailure(failure);
  fake_->setObservations({line("never", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  Delivery delivery;
  auto job = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&delivery));
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
  Data truncated(png.begin(), png.begin() + static_cast<std::ptrdiff_t>(png.size() / 3));
  Data corrupt = png;
  for (std::size_t i = 100; i < corrupt.size(); ++i) corrupt[i] = static_cast<std::uint8_t>(i);
  Data noPixels = png;  // a PNG header claiming 0 x 0 pixels
  for (std::size_t i = 16; i < 24 && i < noPixels.size(); ++i) noPixels[i] = 0;
  Data huge = png;  // and one claiming 30000 x 30000
  huge[16] = 0, huge[17] = 0, huge[18] = 0x75, huge[19] = 0x30;
  huge[20] = 0, huge[21] = 0, huge[22] = 0x75, huge[23] = 0x30;
  std::string text = "a note, not a picture";
  struct Case {
    const char* name;
    std::function<std::shared_ptr<RVVisionOCR>(RVVisionOCR::Completion)> start;
    const char* reasonWord;
  } cases[] = {
      {"missing file",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(dir.file("nothing.png")), {}, false, done);
       },
       "cannot be read"},
      {"empty path", [&](auto done) { return RVVisionOCR::ocrImageAtPath(u"", {}, false, done); },
       "no file"},
      {"truncated PNG",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(write("t.png", truncated)), {}, false, done);
       },
       "corrupt"},
      {"corrupt PNG",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(write("c.png", corrupt)), {}, false, done);
       },
       "corrupt"},
      {"zero-byte file",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(write("z.png", {})), {}, false, done);
       },
       "not an image"},
      {"no pixels",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(write("n.png", noPixels)), {}, false, done);
       },
       "PNG"},
      {"beyond the pixel budget",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(fromUTF8(write("h.png", huge)), {}, true, done);
       },
       "too large"},
      {"text file",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtPath(
             fromUTF8(write("note.txt", Data(text.begin(), text.end()))), {}, false, done);
       },
       "not an image"},
      {"web URL",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtURL("https://example.invalid/p.png", {}, false, done);
       },
       "https"},
      {"file URL of a missing file",
       [&](auto done) {
         return RVVisionOCR::ocrImageAtURL("file:///no/such/page.png", {}, false, done);
       },
       "cannot be read"},
      {"null image", [&](auto done) { return RVVisionOCR::ocrImage(nullptr, {}, false, done); },
       "no image"},
      {"null bitmap", [&](auto done) { return RVVisionOCR::ocrCGImage(nullptr, {}, false, done); },
       "no image"},
  };
  testing::LogCapture log;
  for (const auto& c : cases) {
    Delivery delivery;
    auto job = c.start(recordInto(&delivery));
    finish(job);
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
  for (const auto& c : cases) {
    PlatformRegistry::setPlatformVersion(c.version);
    fake_->setAvailable(c.recognizerAvailable);
    Delivery delivery;
    auto job =
        RVVisionOCR::ocrImageAtPath(u"/no/such/file.png", {"en-US"}, false, recordInto(&delivery));
    ASSERT_EQ(delivery.calls, 1) << c.name;  // synchronously, on this thread
    EXPECT_EQ(delivery.thread, std::this_thread::get_id());
    EXPECT_EQ(delivery.text, u"");
    ASSERT_TRUE(delivery.error);
    EXPECT_EQ(delivery.error->domain, "com.corvelworks.ocr");
    EXPECT_EQ(delivery.error->code, 200);
    EXPECT_EQ(delivery.error->userInfo.size(), 1u);
    EXPECT_EQ(delivery.error->userInfoString("Error reason"),
              "Vision OCR not support on this version of operating system");
    EXPECT_FALSE(job->ocrOperation()) << c.name;
    EXPECT_FALSE(job->layoutAnalyser()) << c.name;
    job->cancelOCRJob();  // nothing to cancel
    // Without a completion there is nothing to report to.
    RVVisionOCR::ocrCGImage(whitePage(), {}, false, nullptr);
  }
  EXPECT_EQ(main_->pending(), 0u);
  EXPECT_TRUE(fake_->requests().empty());
}

TEST_F(OcrJob, NeverMoreThanSixJobsRunAtOnce) {
  fake_->hold();
  std::vector<Delivery> deliveries(10);
  std::vector<std::shared_ptr<RVVisionOCR>> jobs;
  for (auto& delivery : deliveries) {
    jobs.push_back(RVVisionOCR::ocrCGImage(whitePage(), {}, true, recordInto(&delivery)));
  }
  EXPECT_EQ(RVVisionOCR::ocrQueue()->maxConcurrentOperationCount(), 6);
  ASSERT_TRUE(fake_->waitForRunning(6, 10s));
  EXPECT_FALSE(fake_->waitForRunning(7, 100ms));
  fake_->release();
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  main_->drain();
  EXPECT_EQ(fake_->maxRunning(), 6u);
  for (const auto& delivery : deliveries) EXPECT_EQ(delivery.calls, 1);
}

TEST_F(OcrJob, AJobCancelledBeforeItStartsNeverCallsItsCompletion) {
  fake_->hold();
  std::vector<Delivery> running(6);
  std::vector<std::shared_ptr<RVVisionOCR>> jobs;
  for (auto& delivery : running) {
    jobs.push_back(RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&delivery)));
  }
  ASSERT_TRUE(fake_->waitForRunning(6, 10s));
  Delivery cancelled, alsoCancelled, kept;
  auto waiting = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&cancelled));
  auto waitingToo = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&alsoCancelled));
  auto next = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&kept));
  waiting->cancelOCRJob();
  waiting->cancelOCRJob();         // twice: no harm
  waitingToo->setCancelOCR(true);  // only a flag: changes nothing
  waitingToo->cancelOCRJob();
  jobs[0]->cancelOCRJob();  // running: goes on
  fake_->release();
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  main_->drain();
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

TEST_F(OcrJob, CancelAllSkipsTheWaitingJobsAndLetsTheRunningOnesFinish) {
  fake_->hold();
  std::vector<Delivery> deliveries(9);
  std::vector<std::shared_ptr<RVVisionOCR>> jobs;
  for (auto& delivery : deliveries) {
    jobs.push_back(RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&delivery)));
  }
  ASSERT_TRUE(fake_->waitForRunning(6, 10s));
  RVVisionOCR::cancelAllOCRJobs();
  fake_->release();
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  main_->drain();
  int delivered = 0;
  for (const auto& delivery : deliveries) delivered += delivery.calls;
  EXPECT_EQ(delivered, 6);
  for (std::size_t i = 6; i < 9; ++i) EXPECT_EQ(deliveries[i].calls, 0) << i;
}

TEST_F(OcrJob, TheClassFormsReturnANewJobThatRunsWithoutItsHandle) {
  fake_->setObservations({line("kept alive", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  Delivery first, second;
  std::weak_ptr<RVVisionOCR> watch;
  {
    auto a = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&first));
    auto b = RVVisionOCR::ocrCGImage(whitePage(), {}, false, recordInto(&second));
    EXPECT_NE(a, b);
    watch = a;
  }
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  main_->drain();
  EXPECT_EQ(first.text, u"kept alive");
  EXPECT_EQ(second.text, u"kept alive");
  EXPECT_TRUE(watch.expired());  // released once delivered
  // The instance form starts the job it is sent to.
  auto job = RVVisionOCR::init();
  Delivery third;
  job->startOcrCGImage(whitePage(), {}, false, recordInto(&third));
  finish(job);
  EXPECT_EQ(third.calls, 1);
}

}  // namespace
}  // namespace corvel
