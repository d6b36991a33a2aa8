// Block assembly: adding members to containers, cutting paragraphs, and the texts, words
// and writing direction of a block.
#include <algorithm>
#include <cmath>

#include "ocr/AssemblyCache.h"

#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/CJK.h"

namespace corvel {

namespace {

constexpr std::size_t kWordCapacity = 100;
constexpr std::size_t kChildCapacity = 10;
constexpr std::size_t kCachedChildren = 16;

// The whitespace-and-newline set that words are split at.
bool isWhitespaceOrNewline(char16_t u) {
  return u == 0x0009 || u == 0x0020 || u == 0x00A0 || u == 0x1680 || (u >= 0x2000 && u <= 0x200B) ||
         u == 0x202F || u == 0x205F || u == 0x3000 || (u >= 0x000A && u <= 0x000D) || u == 0x0085 ||
         u == 0x2028 || u == 0x2029;
}

std::vector<String> splitAtWhitespace(const String& text) {
  std::vector<String> pieces;
  String piece;
  for (char16_t unit : text) {
    if (isWhitespaceOrNewline(unit)) {
      pieces.push_back(std::move(piece));
      piece.clear();
    } else {
      piece.push_back(unit);
    }
  }
  pieces.push_back(std::move(piece));
  return pieces;
}

// "%@" of a possibly nil string.
String formatted(const std::optional<String>& text) { return text ? *text : u"(null)"; }

// "%@ %@". Appending rather than chaining operator+, which GCC 12 at -O3 misreads.
String joinedWithBlank(const std::optional<String>& first, const std::optional<String>& second) {
  String result = formatted(first);
  result.push_back(u' ');
  result.append(formatted(second));
  return result;
}

}  // namespace

bool RVRecognitionBlock::containsChild(const std::shared_ptr<RVRecognitionBlock>& block) const {
  return std::any_of(childBlocks_->begin(), childBlocks_->end(),
                     [&](const auto& child) { return child && child->isEqual(block); });
}

void RVRecognitionBlock::rebuildText() { setText(buildTextString()); }

void RVRecognitionBlock::setText(std::optional<String> text) {
  text_ = std::move(text);
  textHash_ = textHash(text_);
  invalidateCache();
  changed();
}

void RVRecognitionBlock::setBox(Rect box) {
  boundingBox_ = box;
  changed();
}

void RVRecognitionBlock::changed() {
  // Every watcher's cache goes; they sign up again when they rebuild it.
  for (const auto& watcher : watchers_) {
    if (auto container = watcher.lock()) container->invalidateCache();
  }
  watchers_.clear();
}

void RVRecognitionBlock::watch(RVRecognitionBlock& child) {
  std::weak_ptr<RVRecognitionBlock> self = weak_from_this();
  for (const auto& watcher : child.watchers_) {
    if (!watcher.owner_before(self) && !self.owner_before(watcher)) return;
  }
  child.watchers_.push_back(std::move(self));
}

void RVRecognitionBlock::invalidateCache() {
  if (cache_) cache_->valid = false;
}

void RVRecognitionBlock::buildCache() {
  // Small containers (most paragraphs) rebuild in a few steps; a cache would cost more.
  if (childrenShared_ || childBlocks_->size() < kCachedChildren) return;
  if (!cache_) cache_ = std::make_unique<AssemblyCache>();
  cache_->hashes.clear();
  cache_->minBottom = std::numeric_limits<double>::infinity();
  for (const auto& child : *childBlocks_) {
    if (!child) continue;
    double bottom = rectGetMinY(child->boundingBox_);
    if (!std::isnan(bottom)) cache_->minBottom = std::min(cache_->minBottom, bottom);
    cache_->hashes.insert(child->hash());
    watch(*child);
  }
  cache_->valid = true;
}

// The common case of lines arriving top to bottom, in O(1): exactly what the full path of
// addChildBlock does when the block is no child yet and goes at the end. False (nothing
// done) when the cache cannot tell.
bool RVRecognitionBlock::appendBelowAll(const std::shared_ptr<RVRecognitionBlock>& block) {
  if (childrenShared_ || !cache_ || !cache_->valid || !text_ || block.get() == this) return false;
  std::uint64_t hash = block->hash();
  if (cache_->hashes.count(hash)) return false;  // maybe a child already: let the scan decide
  double bottom = rectGetMinY(block->boundingBox_);
  if (cache_->minBottom < bottom) return false;  // some child lies lower: goes in between
  childBlocks_->push_back(block);
  if (block->matchType_ == RVBlockMatchSameColumn) {
    text_->push_back(u'\n');
    textHash_ = continueTextHash(textHash_, u"\n");
  }
  if (block->text_) {
    text_->append(*block->text_);
    textHash_ = continueTextHash(textHash_, *block->text_);
  }
  boundingBox_ = rectUnion(boundingBox_, block->boundingBox_);
  cache_->hashes.insert(hash);
  if (!std::isnan(bottom)) cache_->minBottom = std::min(cache_->minBottom, bottom);
  watch(*block);
  changed();
  return true;
}

void RVRecognitionBlock::addChildBlock(const std::shared_ptr<RVRecognitionBlock>& block,
                                       RVBlockMatchType continuous) {
  if (!block) return;
  block->matchType_ = continuous;
  block->changed();
  if (appendBelowAll(block)) return;
  if (containsChild(block)) return;
  double bottom = rectGetMinY(block->boundingBox_);
  auto below = std::find_if(childBlocks_->begin(), childBlocks_->end(), [&](const auto& child) {
    return child && rectGetMinY(child->boundingBox_) < bottom;
  });
  childBlocks_->insert(below, block);
  setBox(rectUnion(boundingBox_, block->boundingBox_));
  rebuildText();
  buildCache();
}

void RVRecognitionBlock::insertBlock(const std::shared_ptr<RVRecognitionBlock>& block) {
  if (!block || containsChild(block)) return;
  bool placed = false;
  for (std::size_t i = 0; i < childBlocks_->size() && !placed; ++i) {
    std::shared_ptr<RVRecognitionBlock> child = (*childBlocks_)[i];
    if (!child) continue;
    if (isBlockOnSameLine(block, child)) {
      if (isBlockOnAfterBlock(block, child)) {
        child->appendBlock(block);
      } else {
        child->prependBlock(block);
      }
      placed = true;
    } else if (isBlockAboveBlock(block, child)) {
      childBlocks_->insert(childBlocks_->begin() + static_cast<std::ptrdiff_t>(i), block);
      placed = true;
    }
  }
  // Only a block that went to the end grows the column's box: a merged or inserted block
  // leaves it as it was, which stored analyses depend on.
  if (!placed) {
    childBlocks_->push_back(block);
    setBox(rectUnion(boundingBox_, block->boundingBox_));
  }
  rebuildText();
}

void RVRecognitionBlock::appendBlock(const std::shared_ptr<RVRecognitionBlock>& block) {
  if (!block) return;
  setText(joinedWithBlank(text_, block->text_));
  setBox(rectUnion(boundingBox_, block->boundingBox_));
}

void RVRecognitionBlock::prependBlock(const std::shared_ptr<RVRecognitionBlock>& block) {
  if (!block) return;
  setText(joinedWithBlank(block->text_, text_));
  setBox(rectUnion(boundingBox_, block->boundingBox_));
}

void RVRecognitionBlock::buildParagraphs() {
  auto result = std::make_shared<RVBlockArray>();
  result->reserve(kChildCapacity);
  for (const auto& child : *childBlocks_) {
    if (child && child->level_ == RVRecognitionBlockLevelParagraph) result->push_back(child);
  }
  std::shared_ptr<RVRecognitionBlock> previous, paragraph;
  double spacing = 0;
  std::uint64_t count = 0;
  // Walk a snapshot: a host may have made this block one of its own children.
  const RVBlockArray children = *childBlocks_;
  for (const auto& child : children) {
    if (!child) continue;
    if (!paragraph) {
      paragraph = initParagraphWithBlock(child);
      result->push_back(paragraph);
      spacing = 0;
      count = 0;
    } else {
      double gap = rectGetMinY(previous->boundingBox_) - rectGetMaxY(child->boundingBox_);
      previous->lineSpacing_ = gap;
      if (gap < maxLineSeperation) {
        paragraph->addChildBlock(child, RVBlockMatchSameColumn);
        ++count;
        // A running value kept as it has always been computed, not a true mean.
        spacing = (spacing + gap) / static_cast<double>(count);
      } else {
        paragraph->lineSpacing_ = spacing;
        paragraph = initParagraphWithBlock(child);
        result->push_back(paragraph);
        spacing = 0;
        count = 0;
      }
    }
    previous = child;
  }
  childBlocks_ = std::move(result);
  invalidateCache();
}

String RVRecognitionBlock::buildTextString() const {
  String result;
  for (const auto& child : *childBlocks_) {
    if (!child) continue;
    // Same-line children get no separator: the joins that need a blank are made by
    // appendBlock/prependBlock.
    if (child->matchType_ == RVBlockMatchSameColumn) result.push_back(u'\n');
    if (child->text_) result += *child->text_;
  }
  return result;
}

std::vector<String> RVRecognitionBlock::wordsInBlock() const {
  if (!text_) return {};
  std::vector<String> pieces = splitAtWhitespace(*text_);
  if (text_->size() < 2 || !containsCJKCharacter(*text_)) return pieces;
  std::vector<String> words;
  words.reserve(kWordCapacity);
  for (const String& piece : pieces) {
    if (!containsCJKCharacter(piece)) {
      words.push_back(piece);
      continue;
    }
    String pending;
    for (char16_t unit : piece) {
      String single(1, unit);
      if (!containsCJKCharacter(single)) {
        pending += single;
        continue;
      }
      if (!pending.empty()) words.push_back(pending);
      pending.clear();
      words.push_back(single);
    }
    // A trailing non-CJK run of a mixed piece is dropped, as word splitting always has.
  }
  return words;
}

RVWritingDirection RVRecognitionBlock::writingDirection() const {
  if (!text_ || text_->size() < 2 || !containsCJKCharacter(*text_))
    return RVWritingDirectionHorizontal;
  return rectGetHeight(boundingBox_) > rectGetWidth(boundingBox_) ? RVWritingDirectionVertical
                                                                  : RVWritingDirectionHorizontal;
}

std::optional<String> RVRecognitionBlock::textUsingWritingDirection() const {
  if (writingDirection() != RVWritingDirectionVertical || !text_ || text_->empty()) return text_;
  String result(1, (*text_)[0]);
  for (std::size_t i = 1; i < text_->size(); ++i) {
    result.push_back(u'\n');
    result.push_back((*text_)[i]);
  }
  return result;
}

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::childBlockForString(const String& string,
                                                                            bool remove) {
  auto found = std::find_if(childBlocks_->begin(), childBlocks_->end(), [&](const auto& child) {
    return child && child->text_ && *child->text_ == string;
  });
  if (found == childBlocks_->end()) return nullptr;
  std::shared_ptr<RVRecognitionBlock> child = *found;
  if (remove) {
    invalidateCache();
    std::erase_if(*childBlocks_, [&](const auto& c) { return c && c->isEqual(child); });
  }
  return child;
}

}  // namespace corvel
