// The layout analyser: the driver, column building and cleaning, paragraph building and
// the reading-order text.
#include "Corvelbase/RVTextLayoutAnalyser.h"

#include <algorithm>

namespace corvel {

namespace {

constexpr std::size_t kTextBlockCapacity = 100;
constexpr std::size_t kColumnCapacity = 5;
constexpr std::size_t kParagraphCapacity = 5;
constexpr char16_t kBlockSeparator[] = u"\n\n";

// A stable merge sort that is well defined for any comparator, transitive or not (the
// column order is not), which std::stable_sort does not promise. An element moves ahead
// of an earlier one only when the comparator says it strictly comes first.
void stableSortColumns(RVBlockArray& columns) {
  RVBlockArray buffer(columns.size());
  for (std::size_t width = 1; width < columns.size(); width *= 2) {
    for (std::size_t lo = 0; lo < columns.size(); lo += 2 * width) {
      std::size_t mid = std::min(lo + width, columns.size());
      std::size_t hi = std::min(lo + 2 * width, columns.size());
      std::size_t i = lo, j = mid, k = lo;
      while (i < mid && j < hi) {
        if (compareColumns(columns[j], columns[i], nullptr) < 0) {
          buffer[k++] = columns[j++];
        } else {
          buffer[k++] = columns[i++];
        }
      }
      while (i < mid) buffer[k++] = columns[i++];
      while (j < hi) buffer[k++] = columns[j++];
    }
    std::swap(columns, buffer);
  }
}

}  // namespace

std::int64_t compareColumns(const std::shared_ptr<RVRecognitionBlock>& a,
                            const std::shared_ptr<RVRecognitionBlock>& b, void* /*context*/) {
  if (!a || !b) return 0;
  Rect boxA = a->boundingBox(), boxB = b->boundingBox();
  if (rectGetMaxY(boxA) < rectGetMinY(boxB)) return 1;
  if (rectGetMinY(boxA) <= rectGetMaxY(boxB)) return 0;
  // a lies wholly above b. Horizontal strips at each column's height: for real boxes they
  // never meet here, so this is -1; the test is kept for degenerate boxes.
  Rect stripA{1.0, rectGetMinY(boxA), 10.0, rectGetHeight(boxA)};
  Rect stripB{1.0, rectGetMinY(boxB), 10.0, rectGetHeight(boxB)};
  return rectIsEmpty(rectIntersection(stripA, stripB)) ? -1 : 0;
}

RVTextLayoutAnalyser::RVTextLayoutAnalyser() : textBlocks_(std::make_shared<RVBlockArray>()) {
  textBlocks_->reserve(kTextBlockCapacity);
}

std::shared_ptr<RVTextLayoutAnalyser> RVTextLayoutAnalyser::init() {
  return std::shared_ptr<RVTextLayoutAnalyser>(new RVTextLayoutAnalyser());
}

void RVTextLayoutAnalyser::setTextBlocks(std::shared_ptr<RVBlockArray> blocks) {
  textBlocks_ = blocks ? std::move(blocks) : std::make_shared<RVBlockArray>();
}

void RVTextLayoutAnalyser::addRecognitionBlock(std::shared_ptr<RVRecognitionBlock> block) {
  if (block) textBlocks_->push_back(std::move(block));
}

void RVTextLayoutAnalyser::addRecognitionBlocks(const RVBlockArray& blocks) {
  for (const auto& block : blocks) addRecognitionBlock(block);
}

void RVTextLayoutAnalyser::analyse(Size /*imageSize*/, std::int64_t /*writingDirection*/) {
  buildColumns();
  buildParagraphs();
}

String RVTextLayoutAnalyser::text() {
  if (orderedText_) return *orderedText_;
  orderedText_ = String();
  const auto& source = columnBlocks_ ? columnBlocks_ : textBlocks_;
  orderedText_ = textFromBlocks(*source);
  return *orderedText_;
}

String RVTextLayoutAnalyser::textFromBlocks(const RVBlockArray& blocks) const {
  String result;
  for (const auto& block : blocks) {
    if (!block) continue;
    // The test looks at the text so far, not at this block's: leading empty texts add
    // nothing, a later empty one doubles the next separator.
    if (!result.empty()) result += kBlockSeparator;
    if (block->text()) result += *block->text();
  }
  return result;
}

// ---- Columns.

std::int64_t RVTextLayoutAnalyser::blockMatches(const std::shared_ptr<RVRecognitionBlock>& block,
                                                const RVBlockArray& inColumns) const {
  for (std::size_t i = 0; i < inColumns.size(); ++i) {
    if (inColumns[i] && inColumns[i]->isBlockInColumn(block)) return static_cast<std::int64_t>(i);
  }
  return static_cast<std::int64_t>(NotFound);
}

void RVTextLayoutAnalyser::buildColumns() {
  auto columns = std::make_shared<RVBlockArray>();
  columns->reserve(kColumnCapacity);
  for (const auto& block : *textBlocks_) {
    if (!block) continue;
    std::int64_t match = blockMatches(block, *columns);
    if (match != static_cast<std::int64_t>(NotFound)) {
      (*columns)[static_cast<std::size_t>(match)]->addChildBlock(block, RVBlockMatchSameColumn);
      continue;
    }
    auto column = RVRecognitionBlock::initColumnWithBlock(block);
    double right = rectGetMaxX(column->boundingBox());
    auto whollyRight = std::find_if(columns->begin(), columns->end(), [&](const auto& existing) {
      return rectGetMinX(existing->boundingBox()) > right;
    });
    columns->insert(whollyRight, column);
  }
  columnBlocks_ = columns;
  sanitizeColumns();
}

void RVTextLayoutAnalyser::sanitizeColumns() {
  if (!columnBlocks_) return;
  RVBlockArray& columns = *columnBlocks_;
  RVBlockArray removals;
  // Lone-line columns inside another column join it. Nothing is removed during the walk,
  // so a column already listed for removal can still take in later lone lines, which then
  // go with it: the order of work has always been this, and results depend on it.
  for (std::size_t i = 0; i < columns.size(); ++i) {
    std::shared_ptr<RVRecognitionBlock> column = columns[i];
    if (!column || column->children().size() != 1) continue;
    for (std::size_t j = 0; j < columns.size(); ++j) {
      const auto& other = columns[j];
      if (!other || other->isEqual(column)) continue;
      if (rectContainsRect(other->boundingBox(), column->boundingBox())) {
        std::shared_ptr<RVRecognitionBlock> line = column->children().front();
        other->insertBlock(line);
        removals.push_back(column);
        break;
      }
    }
  }
  // Removal by value: every column equal to a listed one goes.
  std::erase_if(columns, [&](const auto& column) {
    return std::any_of(removals.begin(), removals.end(),
                       [&](const auto& removed) { return removed->isEqual(column); });
  });
  stableSortColumns(columns);
}

// ---- Paragraphs.

void RVTextLayoutAnalyser::buildParagraphs() {
  if (!columnBlocks_) return;
  for (const auto& column : *columnBlocks_) buildParagraphBlocks(column);
}

void RVTextLayoutAnalyser::buildParagraphBlocks(const std::shared_ptr<RVRecognitionBlock>& column) {
  if (!column) return;
  auto paragraphs = std::make_shared<RVBlockArray>();
  paragraphs->reserve(kParagraphCapacity);
  const RVBlockArray lines = column->children();
  for (const auto& line : lines) {
    if (!line) continue;
    RVBlockMatchType matchType = RVBlockMatchNone;
    if (auto paragraph = isContinuous(line, *paragraphs, &matchType)) {
      paragraph->addChildBlock(line, matchType);
      continue;
    }
    auto paragraph = RVRecognitionBlock::initWithText(
        String(), line->boundingBox(), line->confidence(), RVRecognitionBlockLevelParagraph);
    paragraph->addChildBlock(line, RVBlockMatchNone);
    paragraphs->push_back(paragraph);
  }
  column->setChildBlocks(paragraphs);
}

std::shared_ptr<RVRecognitionBlock> RVTextLayoutAnalyser::isContinuous(
    const std::shared_ptr<RVRecognitionBlock>& block, const RVBlockArray& blocks,
    RVBlockMatchType* matchType) const {
  if (!block) return nullptr;
  for (const auto& paragraph : blocks) {
    if (!paragraph) continue;
    RVBlockMatchType found = paragraph->isContinuous(block->boundingBox());
    if (found != RVBlockMatchNone) {
      if (matchType) *matchType = found;
      return paragraph;
    }
  }
  return nullptr;
}

}  // namespace corvel
