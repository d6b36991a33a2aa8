// Recognition jobs with the scripted recogniser: request settings per platform version,
// observations to blocks, delivery on the main queue, errors, cancelling, the queue's
// limit; the language catalogue (combinations, fast support, ordering, what the
// recogniser supports).
#include <gtest/gtest.h>

#include <algorithm>
#include <thread>

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"
#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "support/FakeRecognizer.h"
#include "support/ForwardingRecognizer.h"
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
  std::int64_t code() const { return error ? error->code : 0; }
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
      {"12, fast", {12, 6, 0}, {}, true, 2, {"en-US"}, false},
      {"10.15", {10, 15, 0}, {}, false, std::nullopt, {"en-US"}, false},
      // given codes are passed on, the forced-primary one first
      {"newest, French and Japanese", {}, {"fr-FR", "ja-JP"}, false, 3, {"ja-JP", "fr-FR"}, false},
  };
  for (const auto& c : cases) {
    auto recorder = std::make_shared<testing::FakeRecognizer>();
    PlatformRegistry::setTextRecognizer(recorder);
    PlatformRegistry::setPlatformVersion(c.version);
    Delivery delivery;
    finish(RVVisionOCR::ocrCGImage(whitePage(), c.codes, c.fast, recordInto(&delivery)));
    ASSERT_EQ(recorder->requests().size(), 1u) << c.name;
    const auto r = recorder->requests()[0];
    EXPECT_EQ(std::tuple(r.revision, r.usesLanguageCorrection, r.recognitionLevel, r.languages,
                         r.automaticallyDetectsLanguage, r.width, r.height),
              std::tuple(c.revision, true, c.fast ? 1 : 0, c.languages, c.detect, 40u, 30u))
        << c.name;
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
  // One line-level block per observation with a reading, with no filtering of any kind.
  using Row = std::tuple<std::optional<String>, double, Rect, RVRecognitionBlockLevel>;
  std::vector<Row> rows;
  for (const auto& b : blocks)
    rows.emplace_back(b->text(), b->confidence(), b->boundingBox(), b->level());
  EXPECT_EQ(rows, (std::vector<Row>{
                      {u"half sure", 50.0, Rect(0.1, 0.2, 0.3, 0.05), RVRecognitionBlockLevelLine},
                      {u"best", 75.0, Rect(0.1, 0.5, 0.3, 0.05), RVRecognitionBlockLevelLine},
                      {u"", 25.0, Rect(2, -1, 0, 0), RVRecognitionBlockLevelLine}}));
  // The completion gets the analyser's reading-order text, analysed.
  EXPECT_TRUE(job->layoutAnalyser()->layoutBlocks());
  EXPECT_EQ(delivery.text, job->layoutAnalyser()->text());
  EXPECT_NE(delivery.text.find(u"half sure"), String::npos);
}

// Lines as an engine places them, each with its block (and paragraph).
RecognizedTextObservation at(const char* text, Rect box, std::size_t block) {
  RecognizedTextObservation o = line(text, 0.9f, box);
  o.block = o.paragraph = block;
  return o;
}

TEST_F(OcrJob, ReadingOrdersGiveTheEnginesParagraphsAndKeepRowsTogether) {
  // A receipt: items and prices in blocks side by side, then a paragraph of long lines.
  const std::vector<RecognizedTextObservation> receipt = {
      at("MILK", Rect(0.1, 0.80, 0.2, 0.04), 0),
      at("BREAD", Rect(0.1, 0.70, 0.2, 0.04), 0),
      at("1.99", Rect(0.8, 0.805, 0.1, 0.04), 1),
      at("2.49", Rect(0.8, 0.695, 0.1, 0.04), 1),
      at("Thank you for shopping", Rect(0.1, 0.40, 0.8, 0.04), 2),
      at("and come back soon", Rect(0.1, 0.35, 0.7, 0.04), 2)};
  // Two columns of running text, whose lines align row by row.
  const std::vector<RecognizedTextObservation> columns = {
      at("the first column runs on", Rect(0.05, 0.8, 0.4, 0.03), 0),
      at("and on down the page", Rect(0.05, 0.75, 0.4, 0.03), 0),
      at("the second column starts", Rect(0.55, 0.8, 0.4, 0.03), 1),
      at("and ends at the foot", Rect(0.55, 0.75, 0.4, 0.03), 1)};
  struct Case {
    RVReadingOrder order;
    const std::vector<RecognizedTextObservation>& lines;
    String text;
    std::size_t columns;  // in the tree: one per block, but rows side by side make one
  } cases[] = {
      {RVReadingOrderEngine, receipt,
       u"MILK\nBREAD\n\n1.99\n2.49\n\nThank you for shopping\nand come back soon", 3},
      {RVReadingOrderRows, receipt,
       u"MILK 1.99\nBREAD 2.49\n\nThank you for shopping\nand come back soon", 2},
      // Long lines side by side stay apart.
      {RVReadingOrderRows, columns,
       u"the first column runs on\nand on down the page\n\n"
       u"the second column starts\nand ends at the foot",
       2},
  };
  for (const auto& c : cases) {
    fake_->setObservations(c.lines);
    Delivery delivery;
    auto job = RVVisionOCR::init();
    job->setReadingOrder(c.order);
    job->startOcrCGImage(whitePage(), {}, false, recordInto(&delivery));
    finish(job);
    EXPECT_EQ(delivery.text, c.text) << c.order;
    // The tree holds the same order.
    const auto& tree = *job->layoutAnalyser()->layoutBlocks();
    ASSERT_EQ(tree.size(), c.columns) << c.order;
    EXPECT_EQ(tree[0]->level(), RVRecognitionBlockLevelColumn);
    EXPECT_EQ(job->layoutAnalyser()->text(), c.text);
  }
}

TEST_F(OcrJob, StoppingARunningJobStopsItsRecognitionWhereCancellingLetsItFinish) {
  fake_->hold();
  Delivery stopped, finished;
  auto first = RVVisionOCR::init();
  first->setTimeout(42);
  first->startOcrCGImage(whitePage(), {}, false, recordInto(&stopped));
  auto second = startBlank(&finished);
  ASSERT_TRUE(fake_->waitForRunning(2, 10s));
  first->stopOCRJob();
  second->cancelOCRJob();
  // The stopped recognition comes out while the other is still held.
  ASSERT_TRUE(fake_->waitForRecognitions(1, 10s));
  EXPECT_EQ(fake_->running(), 1u);
  fake_->release();
  settle();
  EXPECT_EQ(std::tuple(stopped.calls, stopped.text, stopped.code()),
            std::tuple(1, String(), TextRecognitionErrorCancelled));
  EXPECT_EQ(std::pair(finished.calls, finished.error), std::pair(1, std::optional<Error>()));
  EXPECT_EQ(fake_->requests().front().timeout, 42);  // the job's, with the request
}

TEST_F(OcrJob, TheCompletionRunsOnTheMainQueueAndTheJobAndImageAreLetGoThere) {
  fake_->setObservations({line("hello", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  auto page = whitePage();
  std::weak_ptr<Bitmap> image = page;
  Delivery delivery;
  // The class form returns a new job that runs without its handle.
  std::weak_ptr<RVVisionOCR> job =
      RVVisionOCR::ocrCGImage(std::move(page), {"en-US"}, true, recordInto(&delivery));
  RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(delivery.calls, 0);
  EXPECT_EQ(main_->pending(), 1u);
  EXPECT_FALSE(image.expired() || job.expired());  // held until delivery
  main_->drain();
  EXPECT_EQ(delivery.calls, 1);
  EXPECT_EQ(delivery.thread, std::this_thread::get_id());
  EXPECT_EQ(delivery.text, u"hello");
  EXPECT_TRUE(image.expired() && job.expired());
}

TEST_F(OcrJob, ARecogniserErrorReachesTheCompletionUnchangedAndIsLogged) {
  testing::LogCapture log;
  // The engine fails after reading the page, so its observations must not leak out.
  struct Failing : testing::ForwardingRecognizer {
    using ForwardingRecognizer::ForwardingRecognizer;
    std::optional<std::vector<RecognizedTextObservation>> recognize(
        const TextRecognitionRequest& request, const Bitmap& bitmap, Error* error) override {
      ForwardingRecognizer::recognize(request, bitmap, error);
      *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure, "it broke");
      return std::nullopt;
    }
  };
  PlatformRegistry::setTextRecognizer(std::make_shared<Failing>(fake_));
  fake_->setObservations({line("never", 0.9f, Rect(0.1, 0.5, 0.3, 0.05))});
  const Error failure = makeTextRecognitionError(TextRecognitionErrorEngineFailure, "it broke");
  Delivery delivery;
  auto job = startBlank(&delivery);
  finish(job);
  EXPECT_EQ(std::tuple(delivery.calls, delivery.text, delivery.error),
            std::tuple(1, String(), std::optional(failure)));
  EXPECT_TRUE(job->layoutAnalyser()->textBlocks()->empty());
  EXPECT_EQ(log.lines(), (std::vector<std::string>{"Error: " + failure.description()}));
}

TEST_F(OcrJob, EveryBadImageEndsInAnErrorSayingWhatWentWrong) {
  // The image's own reasons are the image suite's; here each way in reaches the completion.
  testing::TempDir dir;
  ASSERT_TRUE(writeFileAtomically(dir.file("z.png"), {}));
  // Sources with a scheme go in as URLs, the others as paths, but for the two null images.
  auto start = [](const std::string& source, RVVisionOCR::Completion done) {
    if (source == "null image") return RVVisionOCR::ocrImage(nullptr, {}, false, done);
    if (source == "null bitmap") return RVVisionOCR::ocrCGImage(nullptr, {}, false, done);
    if (source.find("://") != std::string::npos)
      return RVVisionOCR::ocrImageAtURL(source, {}, false, done);
    return RVVisionOCR::ocrImageAtPath(fromUTF8(source), {}, false, done);
  };
  struct Case {
    std::string source;
    const char* reasonWord;
  } cases[] = {
      {"", "no file"},
      {dir.file("z.png"), "not an image"},
      {"https://example.invalid/p.png", "https"},
      {"file:///no/such/page.png", "cannot be read"},
      {"null image", "no image"},
      {"null bitmap", "no image"},
  };
  testing::LogCapture log;
  for (const auto& [source, reasonWord] : cases) {
    Delivery delivery;
    finish(start(source, recordInto(&delivery)));
    ASSERT_EQ(std::tuple(delivery.calls, delivery.text, delivery.code()),
              std::tuple(1, String(), TextRecognitionErrorImageUnreadable))
        << source;
    EXPECT_EQ(delivery.error->domain, TextRecognitionErrorDomain) << source;
    EXPECT_NE(delivery.error->userInfoString("Error reason").find(reasonWord), std::string::npos)
        << source << ": " << delivery.error->userInfoString("Error reason");
  }
  EXPECT_TRUE(fake_->requests().empty());  // the recogniser never saw a bad image
  EXPECT_EQ(log.lines().size(), std::size(cases));
}

TEST_F(OcrJob, WithoutTextRecognitionTheJobEndsAtOnceWithTheUnsupportedError) {
  const Error unsupported{"com.corvelworks.ocr",
                          200,
                          {{"Error reason", PropertyList(u"Vision OCR not support on this "
                                                         u"version of operating system")}}};
  // An old system, and a recogniser without language data.
  for (auto [version, available] :
       {std::pair{PlatformVersion{10, 14, 6}, true}, std::pair{PlatformVersion{}, false}}) {
    PlatformRegistry::setPlatformVersion(version);
    fake_->setAvailable(available);
    Delivery delivery;
    auto job =
        RVVisionOCR::ocrImageAtPath(u"/no/such/file.png", {"en-US"}, false, recordInto(&delivery));
    // Synchronously, on this thread.
    EXPECT_EQ(std::tuple(delivery.calls, delivery.thread, delivery.text, delivery.error),
              std::tuple(1, std::this_thread::get_id(), String(), std::optional(unsupported)));
    EXPECT_FALSE(job->ocrOperation() || job->layoutAnalyser()) << available;
    job->cancelOCRJob();  // nothing to cancel
    // Without a completion there is nothing to report to.
    RVVisionOCR::ocrCGImage(whitePage(), {}, false, nullptr);
  }
  EXPECT_EQ(main_->pending(), 0u);
  EXPECT_TRUE(fake_->requests().empty());
}

TEST_F(OcrJob, SixRunAtOnceAndOnlyWaitingJobsAreCancelled) {
  // Eight jobs: 0-5 run and are held there, 6 and 7 wait.
  auto startEight = [&](std::vector<Delivery>& deliveries) {
    fake_->hold();
    std::vector<std::shared_ptr<RVVisionOCR>> jobs;
    for (auto& delivery : deliveries) jobs.push_back(startBlank(&delivery));
    EXPECT_TRUE(fake_->waitForRunning(6, 10s));
    return jobs;
  };
  std::vector<Delivery> deliveries(8);
  auto jobs = startEight(deliveries);
  jobs[6]->cancelOCRJob();
  jobs[6]->cancelOCRJob();  // twice: no harm
  jobs[0]->cancelOCRJob();  // running: goes on
  fake_->release();
  settle();
  for (std::size_t i = 0; i < 8; ++i) EXPECT_EQ(deliveries[i].calls, i == 6 ? 0 : 1) << i;
  EXPECT_EQ(fake_->requests().size(), 7u);
  // After the job finished, cancelling leaves it as it was.
  jobs[7]->cancelOCRJob();
  EXPECT_FALSE(jobs[7]->ocrOperation()->isCancelled());

  // Cancelling all skips every waiting job and none of the running ones.
  std::vector<Delivery> more(8);
  jobs = startEight(more);
  RVVisionOCR::cancelAllOCRJobs();
  fake_->release();
  settle();
  EXPECT_EQ(fake_->maxRunning(), 6u);
  for (std::size_t i = 0; i < 8; ++i) EXPECT_EQ(more[i].calls, i < 6 ? 1 : 0) << i;
}

// ---- The language catalogue, and the languages the recogniser supports.

std::string stringAt(const PropertyList& entry, const char* key) {
  const PropertyList* value = entry.find(key);
  return value && value->string() ? toUTF8(*value->string()) : "<none>";
}

TEST(LanguageCatalogue, CombinationsFastSupportAndOrdering) {
  // Valid only when led by a code with secondary codes that all the others belong to.
  struct Combination {
    Codes codes;
    bool valid;
  } combinations[] = {{{}, true},
                      {{"zh-Hant", "en-US", "zh-Hant"}, true},  // duplicates included
                      {{"yue-Hans", "en-US"}, true},
                      {{"en-US"}, false},  // no secondary codes, even alone
                      {{"ja-JP", "ko-KR"}, false},
                      {{"xx-XX"}, false}};
  for (const auto& c : combinations)
    EXPECT_EQ(RVVisionOCR::isLanguageCombinationValid(c.codes), c.valid)
        << ::testing::PrintToString(c.codes);
  // Only the simplified Chinese key turns fast recognition off.
  EXPECT_TRUE(RVVisionOCR::supportFastRecognition({}));
  EXPECT_TRUE(RVVisionOCR::supportFastRecognition({"yue-Hans"}));  // by key, not by its code
  EXPECT_FALSE(RVVisionOCR::supportFastRecognition({"en-US", "zh-Hans"}));
  // Only the first forced-primary code moves to the front.
  struct Order {
    Codes in, out;
  } orders[] = {{{}, {}},
                {{"en-US", "ko-KR", "ja-JP"}, {"ko-KR", "en-US", "ja-JP"}},
                {{"xx-XX", "de-DE", "yue-Hant"}, {"yue-Hant", "xx-XX", "de-DE"}}};
  auto job = RVVisionOCR::init();
  for (const auto& c : orders)
    EXPECT_EQ(job->orderLanguageCodes(c.in), c.out) << ::testing::PrintToString(c.in);
}

TEST_F(OcrJob, SupportedLanguagesFollowTheRecognisersOrderFromTenFifteenOn) {
  fake_->setSupportedLanguages(Codes{"ru-RU", "xx-XX", "yue-Hans", "en-US", "ar-SA"});
  PlatformRegistry::setPlatformVersion({10, 14, 6});
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(1));
  EXPECT_TRUE(fake_->supportedQueries().empty());
  PlatformRegistry::setPlatformVersion({10, 15, 0});
  auto entries = RVVisionOCR::supportedLanguages(1);
  ASSERT_TRUE(entries);
  ASSERT_EQ(fake_->supportedQueries().size(), 1u);
  EXPECT_EQ(fake_->supportedQueries()[0].level, 1);
  EXPECT_EQ(fake_->supportedQueries()[0].revision, 0);
  // Codes outside the catalogue are skipped; Cantonese comes back under its own name.
  Codes codes;
  for (const auto& entry : *entries) codes.push_back(stringAt(entry, "isoCode"));
  EXPECT_EQ(codes, (Codes{"ru-RU", "zh-Hans", "en-US"}));
  EXPECT_EQ(stringAt((*entries)[1], "name"), "Cantonese Simplified");
  // None of them known is an empty answer, not none.
  fake_->setSupportedLanguages(Codes{"xx-XX"});
  EXPECT_EQ(RVVisionOCR::supportedLanguages(0), std::vector<PropertyList>{});
  // A recogniser error gives none, and is logged.
  testing::LogCapture log;
  Error error{"test.domain", 5, {}};
  fake_->setSupportedLanguages(std::nullopt, error);
  EXPECT_FALSE(RVVisionOCR::supportedLanguages(0));
  EXPECT_EQ(log.lines(),
            (std::vector<std::string>{"Error getting Vision Languages: " + error.description()}));
}

}  // namespace
}  // namespace corvel
