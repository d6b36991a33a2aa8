#include "platform/tesseract/PageReader.h"

#include <tesseract/ocrclass.h>
#include <tesseract/resultiterator.h>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <map>

#include "platform/image/BitmapNative.h"

namespace corvel::detail {

namespace {

constexpr const char* kOrientationModel = "osd";
// Orientation and script detection below these confidences is a guess.
constexpr float kMinOrientationConfidence = 2.0f;
constexpr float kMinScriptConfidence = 1.0f;
// A word read with less confidence that is this many times as tall as the page's
// typical word is a picture's part, not text (see dropGraphics).
constexpr float kMinTextConfidence = 0.5f;
constexpr double kMaxTextHeightRatio = 3.0;
// A reading is poor below this mean confidence, or with fewer characters than this
// share of the character-like shapes the page shows (when it shows enough to judge).
constexpr double kPoorConfidence = 0.75, kUnreadableConfidence = 0.5;
constexpr double kPoorCoverage = 0.6;
constexpr int kMinCharactersToJudge = 40;
// A block (no more than this share of the page) read with less confidence than this is
// read again on its own, and replaced when that reading gains this much confidence.
constexpr double kWeakBlockConfidence = 0.5, kWeakBlockGain = 0.25;
constexpr double kMaxWeakBlockShare = 0.3;
constexpr int kRegionMargin = 4;
// Characters the measures saw whose centre lies in no line (widened by this many
// pixels) were missed; clusters of at least this many characters about as high as the
// page's text (and pages with at most so many missed, past which the page is a picture
// rather than missed text) are read again, at most this many regions a page, and kept
// at this confidence, line by line where a line overlaps no line read before by more
// than this share of its own box.
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

double threadCpuSeconds() {
  timespec now{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

std::string trimmed(const char* text) {
  std::string s = text ? text : "";
  auto isSpace = [](unsigned char c) { return c == ' ' || c == '\n' || c == '\r' || c == '\t'; };
  while (!s.empty() && isSpace(static_cast<unsigned char>(s.back()))) s.pop_back();
  std::size_t start = 0;
  while (start < s.size() && isSpace(static_cast<unsigned char>(s[start]))) ++start;
  return s.substr(start);
}

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

void PassResult::add(RecognizedTextObservation line) {
  std::string lineText = toUTF8(line.candidates[0].string);
  auto lineCharacters = static_cast<double>(
      std::count_if(lineText.begin(), lineText.end(), [](char c) { return c != ' '; }));
  characters += lineCharacters;
  weight += lineCharacters * line.candidates[0].confidence;
  text += lineText + "\n";
  observations.push_back(std::move(line));
}

Reading judge(const PassResult& result, const PagePlan& plan) {
  if (result.meanConfidence() < kUnreadableConfidence) return Reading::Unreadable;
  if (result.meanConfidence() < kPoorConfidence) return Reading::Doubtful;
  if (plan.characters >= kMinCharactersToJudge &&
      result.characters < kPoorCoverage * plan.characters) {
    return Reading::Sparse;
  }
  return Reading::Good;
}

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

bool applyPlan(Page& page, const PagePlan& plan) {
  if (plan.crop.w > 0) {
    PIX* cropped = cropPage(page.pix, plan.crop);
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

PageReader::PageReader(std::string dataPath, std::uint64_t maxIdleModelBytes,
                       unsigned maxConcurrent)
    : pool_(std::move(dataPath), maxIdleModelBytes), gate_(maxConcurrent) {}

detail::TesseractStatistics PageReader::statistics() const {
  std::lock_guard lock(statsMutex_);
  detail::TesseractStatistics stats = stats_;
  stats.idleEngines = pool_.idleCount();
  return stats;
}

void PageReader::record(double seconds, double cpuSeconds, double startSeconds,
                        double startCpuSeconds, bool started) {
  std::lock_guard lock(statsMutex_);
  ++stats_.recognitions;
  stats_.recognitionSeconds += seconds;
  stats_.recognitionCpuSeconds += cpuSeconds;
  if (started) {
    ++stats_.enginesStarted;
    stats_.engineStartSeconds += startSeconds;
    stats_.engineStartCpuSeconds += startCpuSeconds;
  }
}

// Runs `recognise` and then `collect` on an engine for `key` inside the gate; false
// with *error when no engine can start. Only `recognise` and the engine's clean-up
// count as the engine's time: reading its results into ours is our own work.
template <typename Recognise, typename Collect>
bool PageReader::withEngine(const EngineKey& key, Error* error, Recognise recognise,
                            Collect collect) {
  // Engines are taken inside the gate, so no more of them run (or start) than there
  // are cores, and the pool never holds more engines per key than that.
  gate_.enter();
  double cpuStarted = threadCpuSeconds();
  std::string failure;
  double startSeconds = 0;
  auto engine = pool_.acquire(key, &failure, &startSeconds);
  double startCpuSeconds = threadCpuSeconds() - cpuStarted;
  if (!engine) {
    gate_.leave();
    *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure, failure);
    return false;
  }
  auto clock = std::chrono::steady_clock::now();
  cpuStarted = threadCpuSeconds();
  bool recognised = recognise(engine->api);
  double cpuSeconds = threadCpuSeconds() - cpuStarted;
  double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - clock).count();
  if (recognised) collect(engine->api);
  // An idle engine keeps no page: its copy and results go with the job.
  clock = std::chrono::steady_clock::now();
  cpuStarted = threadCpuSeconds();
  engine->api.Clear();
  cpuSeconds += threadCpuSeconds() - cpuStarted;
  seconds += std::chrono::duration<double>(std::chrono::steady_clock::now() - clock).count();
  pool_.release(std::move(engine));
  gate_.leave();
  record(seconds, cpuSeconds, startSeconds, startCpuSeconds, startSeconds > 0);
  return true;
}

// Orientation and script of the page; the zero answer when detection is not
// installed or cannot tell.
PageReader::Orientation PageReader::detectOrientation(const Page& page, Error* error) {
  Orientation result;
  if (pool_.modelBytes(kOrientationModel) == 0) return result;
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
bool PageReader::recognisePass(const Page& page, const std::string& models,
                               const PassSettings& settings, Watch& watch, bool fast,
                               PassResult* out, Error* error) {
  EngineKey key{models, watch.request->usesLanguageCorrection()};
  bool recognised = false;
  watch.stop = Stop::None;
  watch.maxWords = maxWordsFor(page.pix);
  auto recognise = [&](tesseract::TessBaseAPI& api) {
    // Asked once before the engine starts: its monitor is first called after the page's
    // layout analysis, which a request cancelled (or past its deadline) while it waited
    // for a free engine would otherwise run to the end.
    if (Watch::shouldStop(&watch, 0)) return false;
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
      *error =
          makeTextRecognitionError(TextRecognitionErrorCancelled, "the recognition was cancelled");
      break;
    case Stop::TimedOut:
      *error = makeTextRecognitionError(
          TextRecognitionErrorTimedOut,
          "the recognition ran past its deadline of " + secondsText(watch.seconds) + " s");
      break;
    case Stop::Overgrown:
      *error =
          makeTextRecognitionError(TextRecognitionErrorEngineFailure,
                                   "the page reads as more than " + std::to_string(watch.maxWords) +
                                       " words of specks; it is too noisy to recognise");
      break;
    case Stop::None:
      *error = makeTextRecognitionError(TextRecognitionErrorEngineFailure,
                                        "the recognition engine failed on the image");
      break;
  }
  return false;
}

Rect toWhole(const Rect& box, PageBox region, double width, double height) {
  double top = region.y + (1 - box.origin.y - box.size.height) * region.h;
  return Rect((region.x + box.origin.x * region.w) / width,
              1 - (top + box.size.height * region.h) / height, box.size.width * region.w / width,
              box.size.height * region.h / height);
}

// One reading of the part of `page` inside `region` (its pixels, clipped to the page)
// as one block, with the lines' boxes normalised to the whole page. False with *error
// as recognisePass.
bool PageReader::readRegion(const Page& page, PageBox region, const std::string& models,
                            PassSettings settings, Watch& watch, bool fast, PassResult* out,
                            Error* error) {
  int width = pixGetWidth(page.pix), height = pixGetHeight(page.pix);
  region.w = std::min(region.w, width - region.x);
  region.h = std::min(region.h, height - region.y);
  Page part;
  if (region.w <= 0 || region.h <= 0) return true;
  part.replace(cropPage(page.pix, region));
  if (!part.pix) return true;
  part.resolution = page.resolution;
  settings.singleBlock = true;
  if (!recognisePass(part, models, settings, watch, fast, out, error)) return false;
  for (auto& line : out->observations) {
    line.boundingBox = toWhole(line.boundingBox, region, width, height);
    for (auto& word : line.words)
      word.boundingBox = toWhole(word.boundingBox, region, width, height);
  }
  return true;
}

// Blocks read as near garbage (a transcript's column of line numbers, which the
// engine takes for vertical text) are read again on their own as one block of rows;
// the new reading replaces the old where it is clearly more confident. False with
// *error only when the recognition is stopped.
bool PageReader::rereadWeakBlocks(const Page& page, const std::string& models,
                                  PassSettings settings, Watch& watch, bool fast,
                                  PassResult* result, Error* error) {
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
    PageBox region{
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
  for (auto& line : merged) rebuilt.add(std::move(line));
  *result = std::move(rebuilt);
  return true;
}

// Text the page shows that no line covers (a column of line numbers or prices the
// segmentation dropped) is read again region by region, each as one block; a
// region's confident lines that overlap no line already read are added as blocks of
// their own. False with *error only when the recognition is stopped.
bool PageReader::readMissedRegions(const Page& page, const std::string& models,
                                   PassSettings settings, Watch& watch, bool fast,
                                   PassResult* result, Error* error) {
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
    if (ownHeight < kMinClusterHeight * textHeight || ownHeight > kMaxClusterHeight * textHeight) {
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
      line.block = nextBlock;
      line.paragraph = nextParagraph;
      lines.push_back(l);
      result->add(std::move(line));
      added = true;
    }
    if (added) ++nextBlock, ++nextParagraph;
  }
  return true;
}

namespace {

// Drops the words that are a picture's parts read as text: a bar of a chart, a rule or a
// photograph's edge comes back as a doubtful "word" several times as tall as the page's
// words. Real headings that tall read with good confidence and stay. A line that loses
// words is made of the rest; one that loses all goes.
void dropGraphics(std::vector<RecognizedTextObservation>& lines) {
  std::vector<double> heights;
  for (const auto& line : lines)
    for (const auto& word : line.words)
      if (word.confidence >= kMinTextConfidence) heights.push_back(word.boundingBox.size.height);
  if (heights.size() < 3) return;
  auto middle = heights.begin() + static_cast<std::ptrdiff_t>(heights.size() / 2);
  std::nth_element(heights.begin(), middle, heights.end());
  double tallest = kMaxTextHeightRatio * *middle;
  auto graphic = [&](const RecognizedWord& word) {
    return word.confidence < kMinTextConfidence && word.boundingBox.size.height > tallest;
  };
  std::erase_if(lines, [&](RecognizedTextObservation& line) {
    if (std::erase_if(line.words, graphic) == 0) return false;
    if (line.words.empty()) return true;
    String text;
    Rect box = line.words.front().boundingBox;
    for (const auto& word : line.words) {
      text += (text.empty() ? u"" : u" ") + word.string;
      box = rectUnion(box, word.boundingBox);
    }
    line.candidates.front().string = std::move(text);
    line.boundingBox = box;
    return false;
  });
}

}  // namespace

// The words of the line `line` stands at the start of, for the word-level outputs
// (hOCR, ALTO, TSV, a PDF's text layer). A copy of the iterator walks them, so the
// caller's stepping by lines is unchanged.
void PageReader::collectWords(const tesseract::LTRResultIterator& line, double width, double height,
                              std::vector<RecognizedWord>* words) {
  tesseract::LTRResultIterator it = line;
  do {
    if (it.Empty(tesseract::RIL_WORD)) continue;
    std::unique_ptr<char[]> raw(it.GetUTF8Text(tesseract::RIL_WORD));
    std::string text = trimmed(raw.get());
    int left = 0, top = 0, right = 0, bottom = 0;
    if (text.empty() || !it.BoundingBox(tesseract::RIL_WORD, &left, &top, &right, &bottom)) {
      continue;
    }
    float confidence = std::clamp(it.Confidence(tesseract::RIL_WORD) / 100.0f, 0.0f, 1.0f);
    words->push_back(
        {fromUTF8(text),
         Rect(left / width, 1.0 - bottom / height, (right - left) / width, (bottom - top) / height),
         confidence});
  } while (!it.IsAtFinalElement(tesseract::RIL_TEXTLINE, tesseract::RIL_WORD) &&
           it.PageIterator::Next(tesseract::RIL_WORD));
}

void PageReader::collectLines(tesseract::TessBaseAPI& api, PIX* page, PassResult* out) {
  std::unique_ptr<tesseract::ResultIterator> results(api.GetIterator());
  if (!results) return;
  // The result iterator's own stepping and text put words in right-to-left reading
  // order where a line needs it, and to find out it walks the page from its start for
  // every line: a hundred times the cost of the rest. Every language we read runs left
  // to right, so lines are read through the left-to-right iterator it is built on.
  tesseract::LTRResultIterator* it = results.get();
  double width = pixGetWidth(page), height = pixGetHeight(page);
  std::size_t blocks = 0, paragraphs = 0;
  std::vector<RecognizedTextObservation> lines;
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
    observation.boundingBox =
        Rect(left / width, 1.0 - bottom / height, (right - left) / width, (bottom - top) / height);
    float confidence =
        std::clamp(it->LTRResultIterator::Confidence(tesseract::RIL_TEXTLINE) / 100.0f, 0.0f, 1.0f);
    observation.candidates.push_back({fromUTF8(text), confidence});
    collectWords(*it, width, height, &observation.words);
    observation.block = blocks - 1;
    observation.paragraph = paragraphs - 1;
    lines.push_back(std::move(observation));
  } while (it->PageIterator::Next(tesseract::RIL_TEXTLINE));
  dropGraphics(lines);
  for (auto& line : lines) out->add(std::move(line));
}
}  // namespace corvel::detail
