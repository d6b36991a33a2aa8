// What every recogniser must do, whichever engine is behind it: the scripted fake that the
// job tests stand on, the same fake behind a forwarding wrapper, and the Tesseract engine
// pass the same cases, so a job test written against the fake holds for the real engine.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <set>
#include <sstream>

#include "Corvelbase/RVVisionOCR.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "RecognitionTestHelpers.h"
#include "support/FakeRecognizer.h"
#include "support/ForwardingRecognizer.h"
#include "support/TestSupport.h"
#include "support/TextDistance.h"

namespace corvel {
namespace {

// The page every recogniser reads: a heading over two columns, and its source text.
constexpr const char* kPage = "ocr/two-columns";

std::string pageText() { return testing::fixtureText(std::string(kPage) + ".txt"); }

// The fake answers with the page's lines, stacked from the top as a page prints them.
std::shared_ptr<testing::FakeRecognizer> scriptedFake() {
  auto fake = std::make_shared<testing::FakeRecognizer>();
  std::vector<RecognizedTextObservation> lines;
  std::istringstream text(pageText());
  for (std::string l; std::getline(text, l);) {
    if (l.empty()) continue;
    double top = 0.95 - 0.06 * static_cast<double>(lines.size());
    lines.push_back({Rect(0.1, top - 0.04, 0.8, 0.04), {{fromUTF8(l), 0.9f}}});
  }
  fake->setObservations(std::move(lines));
  return fake;
}

struct Fake {
  static std::shared_ptr<TextRecognizer> make() { return scriptedFake(); }
};
struct Forwarded {
  static std::shared_ptr<TextRecognizer> make() {
    return std::make_shared<testing::ForwardingRecognizer>(scriptedFake());
  }
};
struct Tesseract {
  static std::shared_ptr<TextRecognizer> make() { return TesseractRecognizer::init(); }
};

template <typename Kind>
class RecognizerContract : public ::testing::Test {
 protected:
  // One recogniser for the suite, so the engine starts its models once.
  static void SetUpTestSuite() { recognizer_ = Kind::make(); }
  static void TearDownTestSuite() { recognizer_.reset(); }

  // Performs one fast request on `bitmap` through a handler, as the jobs do.
  testing::Outcome perform(std::shared_ptr<Bitmap> bitmap, std::vector<std::string> codes,
                           std::function<bool()> cancelled = nullptr) {
    PlatformRegistry::setTextRecognizer(recognizer_);
    auto outcome = testing::perform(ImageRequestHandler::initWithCGImage(std::move(bitmap), {}),
                                    TextRecognitionLevelFast, std::move(codes), false,
                                    [&](auto& r) { r.setCancellationCheck(cancelled); });
    PlatformRegistry::setTextRecognizer(nullptr);
    return outcome;
  }
  static std::shared_ptr<Bitmap> page() {
    return Image::initByReferencingFile(testing::fixturePath(std::string(kPage) + ".png"))
        ->bitmap();
  }
  static std::shared_ptr<TextRecognizer> recognizer_;
};
template <typename Kind>
std::shared_ptr<TextRecognizer> RecognizerContract<Kind>::recognizer_;

using Kinds = ::testing::Types<Fake, Forwarded, Tesseract>;
TYPED_TEST_SUITE(RecognizerContract, Kinds);

TYPED_TEST(RecognizerContract, OffersCatalogueCodesOnceEach) {
  ASSERT_TRUE(this->recognizer_->isAvailable());
  const auto& catalogue = RVVisionOCR::allVisionLanguages();
  for (auto level : {TextRecognitionLevelAccurate, TextRecognitionLevelFast}) {
    Error error;
    auto codes = this->recognizer_->supportedRecognitionLanguages(level, 3, &error);
    ASSERT_TRUE(codes) << error.description();
    EXPECT_NE(std::find(codes->begin(), codes->end(), "en-US"), codes->end());
    EXPECT_EQ(std::set<std::string>(codes->begin(), codes->end()).size(), codes->size());
    for (const auto& code : *codes) EXPECT_TRUE(catalogue.count(code)) << code;
  }
}

// Lines come in the engine's reading order with their boxes normalised, origin at the
// bottom left: the heading, read first, is the topmost line.
TYPED_TEST(RecognizerContract, ReadsAPageOfKnownTextAsLinesFromTheTop) {
  auto outcome = this->perform(this->page(), {"en-US"});
  ASSERT_EQ(outcome.handlerCalls, 1);
  ASSERT_FALSE(outcome.error) << outcome.error->description();
  ASSERT_TRUE(outcome.results && !outcome.results->empty());
  const double headingTop = rectGetMaxY(outcome.results->front().boundingBox);
  for (const auto& line : *outcome.results) {
    const Rect& box = line.boundingBox;
    EXPECT_TRUE(rectContainsRect(Rect(0, 0, 1, 1), box) && box.size.height > 0)
        << stringFromRect(box);
    if (&line != &outcome.results->front()) {
      EXPECT_LT(rectGetMaxY(box), headingTop);
    }
    ASSERT_FALSE(line.candidates.empty());
    EXPECT_GT(line.candidates[0].confidence, 0.5f);
    EXPECT_LE(line.candidates[0].confidence, 1.0f);
    // Words lie in their line, give or take a few pixels: the engine's word boxes take in
    // a descender or a comma that its line box leaves out.
    const Rect around{box.origin.x - 0.005, box.origin.y - 0.005, box.size.width + 0.01,
                      box.size.height + 0.01};
    for (const auto& word : line.words)
      EXPECT_TRUE(rectContainsRect(around, word.boundingBox))
          << stringFromRect(box) << " " << stringFromRect(word.boundingBox);
  }
  EXPECT_EQ(toUTF8(outcome.results->front().candidates[0].string), "Notes from the Reading Room");
  const std::string text = outcome.text();
  auto expected = testing::normalised(pageText()), actual = testing::normalised(text);
  EXPECT_LT(testing::editDistance(expected, actual), expected.size() * 3 / 100) << text;
}

// A cancelled request, and a code the recogniser cannot read, are error objects without
// results; the code is named, never a page read in some other language.
TYPED_TEST(RecognizerContract, ACancelledRequestOrACodeItCannotReadFailsWithoutResults) {
  const std::tuple<std::vector<std::string>, bool, std::int64_t> cases[] = {
      {{"en-US"}, true, TextRecognitionErrorCancelled},
      {{"en-US", "xx-XX"}, false, TextRecognitionErrorUnsupportedLanguage},
      {{"en-US", ""}, false, TextRecognitionErrorUnsupportedLanguage}};
  for (const auto& [codes, cancel, errorCode] : cases) {
    const std::string code = codes.back();
    auto outcome = this->perform(this->page(), codes, [&] { return cancel; });
    ASSERT_EQ(outcome.handlerCalls, 1) << code;
    ASSERT_TRUE(outcome.error) << code;
    EXPECT_EQ(outcome.error->domain, TextRecognitionErrorDomain);
    EXPECT_EQ(outcome.error->code, errorCode) << code;
    if (!cancel) {
      EXPECT_NE(outcome.error->userInfoString("Error reason").find("\"" + code + "\""),
                std::string::npos);
    }
    EXPECT_FALSE(outcome.results);
  }
}

}  // namespace
}  // namespace corvel
