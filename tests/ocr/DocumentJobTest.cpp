// Documents and the document job, on the fixture documents (made by Pillow and qpdf, see
// tests/fixtures/documents/make-documents.py) and the scripted recogniser.
#include <gtest/gtest.h>

#include "Corvelbase/RVDocumentOCR.h"
#include "Corvelbase/platform/Document.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Platform.h"
#include "support/FakeRecognizer.h"
#include "support/ManualDispatcher.h"
#include "support/TestSupport.h"

namespace corvel {
namespace {

std::string document(const std::string& name) { return testing::fixturePath("documents/" + name); }

TEST(Document, EachKindOpensWithItsPagesAndRendersThemAtTheirResolution) {
  struct Case {
    std::string path;
    DocumentKind kind;
    std::size_t pages;
    std::size_t page;  // rendered
    std::uint32_t width, height;
    double resolution;
  } cases[] = {
      // A scanned PDF page renders at its picture's 150 dpi: the picture's own pixels.
      {document("scan.pdf"), DocumentKind::Pdf, 2, 1, 1240, 1000, 150},
      // A page without a picture renders at 300 dpi (US Letter).
      {document("mixed.pdf"), DocumentKind::Pdf, 2, 0, 2550, 3300, 300},
      {document("pages.tif"), DocumentKind::Tiff, 2, 1, 1000, 455, 150},
      {testing::fixturePath("ocr/sample.png"), DocumentKind::Image, 1, 0, 1240, 900, 150},
  };
  for (const auto& c : cases) {
    Error error;
    auto opened = Document::initWithFile(c.path, &error);
    ASSERT_TRUE(opened) << c.path << ": " << error.description();
    EXPECT_EQ(opened->kind(), c.kind) << c.path;
    EXPECT_EQ(opened->pageCount(), c.pages) << c.path;
    double resolution = 0;
    auto bitmap = opened->renderPage(c.page, &error, &resolution);
    ASSERT_TRUE(bitmap) << c.path << ": " << error.description();
    EXPECT_NEAR(bitmap->width(), c.width, 1) << c.path;
    EXPECT_NEAR(bitmap->height(), c.height, 1) << c.path;
    EXPECT_NEAR(resolution, c.resolution, 0.5) << c.path;
    EXPECT_FALSE(opened->renderPage(c.pages, &error, nullptr)) << c.path;
    EXPECT_EQ(error.code, DocumentErrorPageRange);
  }
  auto mixed = Document::initWithFile(document("mixed.pdf"), nullptr);
  EXPECT_EQ(toUTF8(mixed->pageText(0)), "Typed words stay as they are");
  EXPECT_EQ(mixed->pageText(1), String());
}

TEST(Document, WhatIsNoDocumentIsRefusedSayingWhy) {
  testing::TempDir dir;
  auto scan = readFile(document("scan.pdf"));
  auto tiff = readFile(document("pages.tif"));
  ASSERT_TRUE(scan && tiff);
  struct Case {
    std::string name;
    Data bytes;
    std::int64_t code;
  } cases[] = {
      {"text.txt", Data{'h', 'e', 'l', 'l', 'o'}, DocumentErrorUnreadable},
      {"empty.pdf", Data{'%', 'P', 'D', 'F', '-'}, DocumentErrorDamaged},
      {"cut.tif", Data(tiff->begin(), tiff->begin() + 8), DocumentErrorDamaged},
      {"missing.pdf", Data(), DocumentErrorUnreadable},
  };
  for (const auto& c : cases) {
    if (!c.bytes.empty()) {
      ASSERT_TRUE(writeFileAtomically(dir.file(c.name), c.bytes));
    }
    Error error;
    EXPECT_FALSE(Document::initWithFile(dir.file(c.name), &error)) << c.name;
    EXPECT_EQ(error.code, c.code) << c.name;
    EXPECT_FALSE(error.userInfoString("Error reason").empty()) << c.name;
  }
  // A PDF cut short opens (its pages are found again) or is refused; never a crash.
  ASSERT_TRUE(writeFileAtomically(dir.file("cut.pdf"), Data(scan->begin(), scan->begin() + 2000)));
  Error error;
  if (auto cut = Document::initWithFile(dir.file("cut.pdf"), &error)) {
    for (std::size_t i = 0; i < cut->pageCount(); ++i) cut->renderPage(i, &error, nullptr);
  }
}

class DocumentJob : public ::testing::Test {
 protected:
  void SetUp() override {
    PlatformRegistry::setTextRecognizer(fake_);
    PlatformRegistry::setMainQueueDispatcher(main_);
    fake_->setObservations({{Rect(0.1, 0.8, 0.5, 0.05), {{u"words", 0.9f}}}});
  }
  void TearDown() override {
    fake_->release();
    settle();
    PlatformRegistry::setTextRecognizer(nullptr);
    PlatformRegistry::setMainQueueDispatcher(nullptr);
  }
  struct Run {
    std::vector<RVDocumentPage> pages;
    std::optional<std::optional<Error>> completion;
  };
  std::shared_ptr<RVDocumentOCR> start(const std::string& path, Run* run, bool force = false) {
    auto job = RVDocumentOCR::init();
    job->setForceOCR(force);
    job->startOcrDocumentAtPath(
        path, {"en-US"}, false, [run](const RVDocumentPage& page) { run->pages.push_back(page); },
        [run](const std::optional<Error>& error) { run->completion = error; });
    return job;
  }
  void settle() {
    RVVisionOCR::ocrQueue()->waitUntilAllOperationsAreFinished();
    main_->drain();
  }

  std::shared_ptr<testing::FakeRecognizer> fake_ = std::make_shared<testing::FakeRecognizer>();
  std::shared_ptr<testing::ManualDispatcher> main_ = std::make_shared<testing::ManualDispatcher>();
};

TEST_F(DocumentJob, EveryPageIsDeliveredOnceInOrderThenTheCompletion) {
  Run run;
  auto job = start(document("pages.tif"), &run);
  settle();
  std::vector<std::tuple<std::size_t, bool, std::string>> got;  // index, error, text
  for (const auto& p : run.pages) got.emplace_back(p.index, p.error.has_value(), toUTF8(p.text));
  EXPECT_EQ(got, (decltype(got){{0, false, "words"}, {1, false, "words"}}));
  ASSERT_TRUE(run.completion);
  EXPECT_FALSE(*run.completion);
  EXPECT_EQ(job->pagesDelivered(), 2u);
  EXPECT_EQ(fake_->requests().size(), 2u);
}

TEST_F(DocumentJob, APdfPageWithTextIsKeptUnlessForced) {
  for (bool force : {false, true}) {
    Run run;
    start(document("mixed.pdf"), &run, force);
    settle();
    ASSERT_EQ(run.pages.size(), 2u);
    EXPECT_EQ(run.pages[0].hasOwnText, !force);
    EXPECT_EQ(toUTF8(run.pages[0].text), force ? "words" : "Typed words stay as they are");
    EXPECT_FALSE(run.pages[1].hasOwnText);
  }
  EXPECT_EQ(fake_->requests().size(), 3u);  // the scanned page twice, the typed page once
}

TEST_F(DocumentJob, CancellingStopsRunningPagesAndDeliversTheRestCancelled) {
  fake_->hold();
  Run run;
  auto job = start(document("scan.pdf"), &run);
  ASSERT_TRUE(fake_->waitForRunning(1, std::chrono::seconds(10)));
  job->cancel();
  settle();
  ASSERT_EQ(run.pages.size(), 2u);
  for (const auto& page : run.pages)
    EXPECT_EQ(page.error.value_or(Error{}).code, TextRecognitionErrorCancelled);
  ASSERT_TRUE(run.completion && *run.completion);
  EXPECT_EQ((*run.completion)->code, TextRecognitionErrorCancelled);
}

TEST_F(DocumentJob, AFileThatIsNoDocumentEndsTheJobWithItsError) {
  Run run;
  start(testing::fixturePath("documents/make-documents.py"), &run);
  main_->drain();
  EXPECT_TRUE(run.pages.empty());
  ASSERT_TRUE(run.completion && *run.completion);
  EXPECT_EQ((*run.completion)->domain, DocumentErrorDomain);
}

}  // namespace
}  // namespace corvel
