#include "ocr/EngineOrder.h"

#include <algorithm>
#include <memory>
#include <numeric>

namespace corvel::detail {

namespace {

const char16_t kLineSeparator[] = u"\n";
const char16_t kParagraphSeparator[] = u"\n\n";
const char16_t kCellSeparator[] = u" ";
// A block of short lines has at most this many words on its median line.
constexpr std::size_t kMaxShortLineWords = 3;
// Two lines share a row when their vertical overlap is at least this share of the
// lower one's height.
constexpr double kRowOverlap = 0.5;
// Blocks side by side are read in rows when this share of the smaller one's lines has a
// partner in the other.
constexpr double kMinPairedShare = 0.5;
// Blocks overlapping horizontally by more than this share of the narrower are not side
// by side.
constexpr double kMaxSideOverlap = 0.2;

// A container of `level` over `children`, which must not be empty.
std::shared_ptr<RVRecognitionBlock> container(RVBlockArray children, RVRecognitionBlockLevel level,
                                              const char16_t* separator) {
  String text;
  Rect box = children.front()->boundingBox();
  double confidence = 0;
  for (const auto& child : children) {
    if (!text.empty()) text += separator;
    text += child->text().value_or(String());
    box = rectUnion(box, child->boundingBox());
    confidence += child->confidence();
  }
  auto block = RVRecognitionBlock::initWithText(
      text, box, confidence / static_cast<double>(children.size()), level);
  block->setChildBlocks(std::make_shared<RVBlockArray>(std::move(children)));
  return block;
}

}  // namespace

RVBlockArray engineOrderColumns(const std::vector<RecognizedTextObservation>& observations) {
  RVBlockArray columns, paragraphs, lines;
  const RecognizedTextObservation* previous = nullptr;
  auto closeParagraph = [&] {
    if (!lines.empty()) {
      paragraphs.push_back(
          container(std::move(lines), RVRecognitionBlockLevelParagraph, kLineSeparator));
    }
    lines.clear();
  };
  auto closeColumn = [&] {
    closeParagraph();
    if (!paragraphs.empty()) {
      columns.push_back(
          container(std::move(paragraphs), RVRecognitionBlockLevelColumn, kParagraphSeparator));
    }
    paragraphs.clear();
  };
  for (const auto& observation : observations) {
    if (observation.candidates.empty()) continue;
    if (previous && observation.block != previous->block) {
      closeColumn();
    } else if (previous && observation.paragraph != previous->paragraph) {
      closeParagraph();
    }
    const auto& best = observation.candidates.front();
    lines.push_back(RVRecognitionBlock::initWithText(best.string, observation.boundingBox,
                                                     static_cast<double>(best.confidence) * 100.0,
                                                     RVRecognitionBlockLevelLine));
    previous = &observation;
  }
  closeColumn();
  return columns;
}

namespace {

double verticalOverlap(const Rect& a, const Rect& b) {
  double top = std::min(a.origin.y + a.size.height, b.origin.y + b.size.height);
  double bottom = std::max(a.origin.y, b.origin.y);
  return top - bottom;
}

bool shareRow(const Rect& a, const Rect& b) {
  return verticalOverlap(a, b) >= kRowOverlap * std::min(a.size.height, b.size.height);
}

std::size_t wordCount(const String& text) {
  std::size_t words = 0;
  bool inWord = false;
  for (char16_t c : text) {
    bool space = c == u' ' || c == u'\t';
    if (!space && !inWord) ++words;
    inWord = !space;
  }
  return words;
}

struct BlockLines {
  std::vector<std::size_t> lines;  // indices into the observations
  Rect box;
  bool shortLines = false;
};

bool sideBySide(const BlockLines& a, const BlockLines& b) {
  double left = std::max(a.box.origin.x, b.box.origin.x);
  double right = std::min(a.box.origin.x + a.box.size.width, b.box.origin.x + b.box.size.width);
  double narrower = std::min(a.box.size.width, b.box.size.width);
  return right - left <= kMaxSideOverlap * narrower && verticalOverlap(a.box, b.box) > 0;
}

bool pairUp(const BlockLines& a, const BlockLines& b,
            const std::vector<RecognizedTextObservation>& observations) {
  const BlockLines& fewer = a.lines.size() <= b.lines.size() ? a : b;
  const BlockLines& more = &fewer == &a ? b : a;
  std::size_t paired = 0;
  for (std::size_t i : fewer.lines) {
    for (std::size_t j : more.lines) {
      if (shareRow(observations[i].boundingBox, observations[j].boundingBox)) {
        ++paired;
        break;
      }
    }
  }
  return static_cast<double>(paired) >= kMinPairedShare * static_cast<double>(fewer.lines.size());
}

std::size_t findRoot(std::vector<std::size_t>& parent, std::size_t i) {
  while (parent[i] != i) i = parent[i] = parent[parent[i]];
  return i;
}

std::shared_ptr<RVRecognitionBlock> lineBlock(const RecognizedTextObservation& observation) {
  const auto& best = observation.candidates.front();
  return RVRecognitionBlock::initWithText(best.string, observation.boundingBox,
                                          static_cast<double>(best.confidence) * 100.0,
                                          RVRecognitionBlockLevelLine);
}

// The lines of a group of blocks as rows, top to bottom, each left to right.
std::shared_ptr<RVRecognitionBlock> rowsOf(
    std::vector<std::size_t> lines, const std::vector<RecognizedTextObservation>& observations) {
  auto top = [&](std::size_t i) {
    const Rect& box = observations[i].boundingBox;
    return box.origin.y + box.size.height;
  };
  std::sort(lines.begin(), lines.end(),
            [&](std::size_t a, std::size_t b) { return top(a) > top(b); });
  RVBlockArray rows;
  std::vector<std::size_t> row;
  Rect rowBox;
  auto closeRow = [&] {
    if (row.empty()) return;
    std::sort(row.begin(), row.end(), [&](std::size_t a, std::size_t b) {
      return observations[a].boundingBox.origin.x < observations[b].boundingBox.origin.x;
    });
    RVBlockArray cells;
    for (std::size_t i : row) cells.push_back(lineBlock(observations[i]));
    rows.push_back(container(std::move(cells), RVRecognitionBlockLevelLine, kCellSeparator));
    row.clear();
  };
  for (std::size_t i : lines) {
    const Rect& box = observations[i].boundingBox;
    if (!row.empty() && shareRow(rowBox, box)) {
      row.push_back(i);
      rowBox = rectUnion(rowBox, box);
      continue;
    }
    closeRow();
    row.push_back(i);
    rowBox = box;
  }
  closeRow();
  auto paragraph = container(std::move(rows), RVRecognitionBlockLevelParagraph, kLineSeparator);
  return container({paragraph}, RVRecognitionBlockLevelColumn, kParagraphSeparator);
}

}  // namespace

RVBlockArray rowsOrderColumns(const std::vector<RecognizedTextObservation>& observations) {
  // The engine's blocks, in its order.
  std::vector<BlockLines> blocks;
  std::vector<std::size_t> blockOf(observations.size(), 0);
  for (std::size_t i = 0; i < observations.size(); ++i) {
    if (observations[i].candidates.empty()) continue;
    if (blocks.empty() || observations[i].block != observations[blocks.back().lines.back()].block) {
      blocks.push_back({{}, observations[i].boundingBox, false});
    }
    blocks.back().lines.push_back(i);
    blocks.back().box = rectUnion(blocks.back().box, observations[i].boundingBox);
    blockOf[i] = blocks.size() - 1;
  }
  for (auto& block : blocks) {
    std::vector<std::size_t> words;
    for (std::size_t i : block.lines)
      words.push_back(wordCount(observations[i].candidates[0].string));
    std::nth_element(words.begin(), words.begin() + static_cast<std::ptrdiff_t>(words.size() / 2),
                     words.end());
    block.shortLines = words[words.size() / 2] <= kMaxShortLineWords;
  }
  std::vector<std::size_t> parent(blocks.size());
  std::iota(parent.begin(), parent.end(), 0);
  for (std::size_t a = 0; a < blocks.size(); ++a) {
    for (std::size_t b = a + 1; b < blocks.size(); ++b) {
      if ((blocks[a].shortLines || blocks[b].shortLines) && sideBySide(blocks[a], blocks[b]) &&
          pairUp(blocks[a], blocks[b], observations)) {
        parent[findRoot(parent, b)] = findRoot(parent, a);
      }
    }
  }
  // Groups in the order of their first block; a lone block keeps its paragraphs.
  RVBlockArray columns;
  std::vector<bool> done(blocks.size(), false);
  for (std::size_t a = 0; a < blocks.size(); ++a) {
    std::size_t root = findRoot(parent, a);
    if (done[root]) continue;
    done[root] = true;
    std::vector<std::size_t> members;
    for (std::size_t b = a; b < blocks.size(); ++b) {
      if (findRoot(parent, b) == root) members.push_back(b);
    }
    if (members.size() == 1) {
      std::vector<RecognizedTextObservation> own;
      for (std::size_t i : blocks[a].lines) own.push_back(observations[i]);
      for (auto& column : engineOrderColumns(own)) columns.push_back(column);
      continue;
    }
    std::vector<std::size_t> lines;
    for (std::size_t b : members)
      lines.insert(lines.end(), blocks[b].lines.begin(), blocks[b].lines.end());
    columns.push_back(rowsOf(std::move(lines), observations));
  }
  return columns;
}

String engineOrderText(const RVBlockArray& columns) {
  String text;
  for (const auto& column : columns) {
    if (!column->text() || column->text()->empty()) continue;
    if (!text.empty()) text += kParagraphSeparator;
    text += *column->text();
  }
  return text;
}

}  // namespace corvel::detail
