// The layout analyser: the driver, column building and cleaning, paragraph building and
// the reading-order text.
#include "Corvelbase/RVTextLayoutAnalyser.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

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

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr std::size_t kNone = std::numeric_limits<std::size_t>::max();

// A line can continue paragraph P only if its top reaches P's key: the same-line test wants
// the line's bottom at least at L.minY + allowance (L: P's last line), the same-column test
// its top at least at S.minY - maxLineSeperation (S: P's box), and a bottom never lies above
// its top. Parts of the key that are NaN make their test fail, so they count as +infinity.
double paragraphKey(const RVRecognitionBlock& paragraph) {
  double sameLine = kInfinity;
  const RVBlockArray& lines = paragraph.children();
  if (!lines.empty() && lines.back()) {
    double bound = rectGetMinY(lines.back()->boundingBox()) + allowance;
    if (!std::isnan(bound)) sameLine = bound;
  }
  double sameColumn = rectGetMinY(paragraph.boundingBox()) - maxLineSeperation;
  if (std::isnan(sameColumn)) sameColumn = kInfinity;
  return std::min(sameLine, sameColumn);
}

// The paragraphs' keys in a min-tree, so that the earliest paragraph that might take a
// line is found in O(log n) instead of asking every paragraph above it. Keys only change
// when a paragraph takes a line.
class ParagraphIndex {
 public:
  void push(double key) {
    if (size_ == capacity_) grow();
    set(size_++, key);
  }
  void set(std::size_t i, double key) {
    std::size_t node = capacity_ + i;
    tree_[node] = key;
    for (node /= 2; node > 0; node /= 2)
      tree_[node] = std::min(tree_[2 * node], tree_[2 * node + 1]);
  }
  // The first index at or after `from` whose key is at most `top`, or kNone.
  std::size_t firstAtMost(double top, std::size_t from) const {
    return size_ == 0 ? kNone : find(1, 0, capacity_, top, from);
  }

 private:
  std::size_t find(std::size_t node, std::size_t lo, std::size_t hi, double top,
                   std::size_t from) const {
    if (hi <= from || !(tree_[node] <= top)) return kNone;
    if (hi - lo == 1) return lo < size_ ? lo : kNone;
    std::size_t mid = lo + (hi - lo) / 2;
    std::size_t left = find(2 * node, lo, mid, top, from);
    return left != kNone ? left : find(2 * node + 1, mid, hi, top, from);
  }
  void grow() {
    std::vector<double> keys(tree_.begin() + static_cast<std::ptrdiff_t>(capacity_),
                             tree_.begin() + static_cast<std::ptrdiff_t>(capacity_ + size_));
    capacity_ = capacity_ == 0 ? 8 : 2 * capacity_;
    tree_.assign(2 * capacity_, kInfinity);
    std::size_t count = size_;
    size_ = 0;
    for (std::size_t i = 0; i < count; ++i) set(size_++, keys[i]);
  }

  std::size_t size_ = 0, capacity_ = 0;
  std::vector<double> tree_;
};

// The earliest paragraph that takes `line` (its position and the match type), asking only
// the paragraphs whose key allows it; the same answer as asking every one in order.
std::size_t findParagraph(const RVRecognitionBlock& line, const RVBlockArray& paragraphs,
                          const ParagraphIndex& index, RVBlockMatchType* matchType) {
  Rect box = line.boundingBox();
  double top = rectGetMaxY(box);
  bool indexed = !std::isnan(top) && rectGetMinY(box) <= top;
  for (std::size_t i = indexed ? index.firstAtMost(top, 0) : 0; i < paragraphs.size();
       i = indexed ? index.firstAtMost(top, i + 1) : i + 1) {
    if (!paragraphs[i]) continue;
    RVBlockMatchType found = paragraphs[i]->isContinuous(box);
    if (found != RVBlockMatchNone) {
      *matchType = found;
      return i;
    }
  }
  return kNone;
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
  ParagraphIndex index;
  const RVBlockArray lines = column->children();
  for (const auto& line : lines) {
    if (!line) continue;
    RVBlockMatchType matchType = RVBlockMatchNone;
    std::size_t found = findParagraph(*line, *paragraphs, index, &matchType);
    if (found != kNone) {
      (*paragraphs)[found]->addChildBlock(line, matchType);
      index.set(found, paragraphKey(*(*paragraphs)[found]));
      continue;
    }
    auto paragraph = RVRecognitionBlock::initWithText(
        String(), line->boundingBox(), line->confidence(), RVRecognitionBlockLevelParagraph);
    paragraph->addChildBlock(line, RVBlockMatchNone);
    paragraphs->push_back(paragraph);
    index.push(paragraphKey(*paragraph));
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
