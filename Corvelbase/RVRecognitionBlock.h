// RVRecognitionBlock: one piece of recognised text with its place on the page.
//
// A block is a line (as the recogniser reports it), a paragraph or a column. Containers
// hold their members in `childBlocks`, ordered from the top of the page down, and keep a
// `text` rebuilt from them as members are added. Geometry is normalised to the image:
// 0..1 on both axes, origin at the bottom-left corner, y growing upwards.
//
// Identity and sharing: blocks are held by std::shared_ptr. `copy()` returns the block
// itself; containers share their children, never copy them. `childBlocks()` is the live,
// mutable array (shared by reference): changing it changes the block.
//
// Threads: a block is not thread-safe. One thread builds and assembles a tree; once it is
// complete, any thread may read it.
//
// Several behaviours below look odd and are relied upon by stored analyses and by hosts
// that compare results, so they are kept on purpose: the same-line test wants the new
// box's bottom at least `allowance` above the last child's; same-line children are joined
// with no separator; `copy` is the identity; confidence is rounded through single
// precision when read back from the dictionary form.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// Layout tolerances in normalised image units. Exported and mutable: the library reads
// them at every use, so a host may tune them before (or between) analyses. Not
// synchronised: change them only while no analysis runs.
//
// Largest horizontal gap between one block's right edge and the next block's left edge
// on the same line (strict: a gap equal to it is too large).
CORVEL_EXPORT extern double maxWordSeperation;  // 0.005
// Largest vertical gap between two lines of one paragraph.
CORVEL_EXPORT extern double maxLineSeperation;  // 0.005
// How far a same-line block's bottom must sit above the last child's bottom.
CORVEL_EXPORT extern double allowance;  // 0.0006
// Tolerance between left edges for column membership (strict on both sides).
CORVEL_EXPORT extern double columnMatchAllowance;  // 0.015
// The `lineSpacing` of a block whose spacing was never measured.
CORVEL_EXPORT extern double spacingUndefined;  // -1000.0

enum RVRecognitionBlockLevel : std::uint64_t {
  RVRecognitionBlockLevelColumn = 0,
  RVRecognitionBlockLevelParagraph = 1,
  RVRecognitionBlockLevelLine = 2
};

// How a child joins the child before it; chooses the separator in buildTextString().
enum RVBlockMatchType : std::uint64_t {
  RVBlockMatchNone = 0,        // nothing between the texts
  RVBlockMatchSameLine = 1,    // same line: nothing between the texts either
  RVBlockMatchSameColumn = 2,  // next line of the column: a line feed
};

enum RVWritingDirection : std::int64_t {
  RVWritingDirectionHorizontal = 0,
  RVWritingDirectionVertical = 2,
};

// Origin kinds for setBoundingBox(); every value but TopLeft means bottom-left.
enum RVBoundingBoxOrigin : std::uint64_t {
  RVBoundingBoxOriginBottomLeft = 0,
  RVBoundingBoxOriginTopLeft = 2,
};

class RVRecognitionBlock;
using RVBlockArray = std::vector<std::shared_ptr<RVRecognitionBlock>>;

// Keys of the dictionary form (blockInformation / createBlockFromInfo).
CORVEL_EXPORT extern const char* const kRVBlockTypeKey;         // "type"
CORVEL_EXPORT extern const char* const kRVBlockTextKey;         // "text"
CORVEL_EXPORT extern const char* const kRVBlockBoundingBoxKey;  // "boundingBox"
CORVEL_EXPORT extern const char* const kRVBlockConfidenceKey;   // "confidence"
CORVEL_EXPORT extern const char* const kRVBlockLevelKey;        // "level"
CORVEL_EXPORT extern const char* const kRVBlockChildBlocksKey;  // "childBlocks"

class CORVEL_EXPORT RVRecognitionBlock : public std::enable_shared_from_this<RVRecognitionBlock> {
 public:
  // ---- Initialisers. None validates: nil text, boxes outside 0..1, NaN and any level
  // are stored as given. Every new block has matchType 0, lineSpacing spacingUndefined
  // and a non-null childBlocks array.

  // A leaf (or empty container) block.
  static std::shared_ptr<RVRecognitionBlock> initWithText(std::optional<String> text,
                                                          Rect boundingBox, double confidence,
                                                          RVRecognitionBlockLevel level);
  // A column (level 0) / paragraph (level 1) whose only child is `block`, taking its text,
  // box and confidence. nullptr when `block` is null.
  static std::shared_ptr<RVRecognitionBlock> initColumnWithBlock(
      const std::shared_ptr<RVRecognitionBlock>& block);
  static std::shared_ptr<RVRecognitionBlock> initParagraphWithBlock(
      const std::shared_ptr<RVRecognitionBlock>& block);

  RVRecognitionBlock(const RVRecognitionBlock&) = delete;
  RVRecognitionBlock& operator=(const RVRecognitionBlock&) = delete;
  virtual ~RVRecognitionBlock();

  // ---- Accessors.
  const std::optional<String>& text() const { return text_; }
  Rect boundingBox() const { return boundingBox_; }
  double confidence() const { return confidence_; }
  RVRecognitionBlockLevel level() const { return level_; }
  // The live array (never null). Handing it out means it may change behind this block's
  // back, so from then on additions take the full path (rebuild the text, rescan the
  // children) instead of the constant-time one; read through children() where a view is
  // enough.
  const std::shared_ptr<RVBlockArray>& childBlocks() const {
    if (!childrenShared_.load(std::memory_order_relaxed))
      childrenShared_.store(true, std::memory_order_relaxed);
    return childBlocks_;
  }
  // The children, read-only.
  const RVBlockArray& children() const { return *childBlocks_; }
  // Replaces the array as given, with no other effect (text and box are not rebuilt);
  // nullptr installs a new empty array so childBlocks() stays non-null.
  void setChildBlocks(std::shared_ptr<RVBlockArray> childBlocks);
  RVBlockMatchType matchType() const { return matchType_; }
  void setMatchType(RVBlockMatchType matchType);
  double lineSpacing() const { return lineSpacing_; }
  void setLineSpacing(double lineSpacing) { lineSpacing_ = lineSpacing; }

  // ---- Geometry of the record.

  // Stores x, width and height as given; with RVBoundingBoxOriginTopLeft the box was
  // measured from the top-left corner and y becomes 1 - (y + height).
  void setBoundingBox(Rect boundingBox, std::uint64_t forOrigin);
  // The box scaled to an image of `size` (no flip, no rounding).
  Rect boundingBoxAtImageOfSize(Size size) const;
  // lineSpacing * height; an unset spacing gives -1000 * height, so test first.
  double lineSpacingForHeight(double height) const;

  // ---- Object protocol.

  // The block itself.
  std::shared_ptr<RVRecognitionBlock> copy();
  // level + trunc(confidence * 10000) * 11813 + textHash * 13411, wrapping in unsigned
  // 64-bit arithmetic. The truncation saturates: NaN and negatives give 0, values past
  // 2^64 give 2^64 - 1. The text hash is FNV-1a over the UTF-16 units (0 for nil), so it
  // is stable across runs.
  std::uint64_t hash() const;
  // Value equality: the same object, or (in this order) `other` of this block's class or
  // a subclass of it, equal hashes, levels, confidences closer than single-precision
  // epsilon, identical boxes (all four doubles; a NaN box is equal only to itself) and
  // equal texts (two nil texts are equal). Children, matchType and lineSpacing do not
  // count. False for nullptr. Not symmetric across classes: a plain block may equal an
  // instance of a host's subclass, but the subclass's instance never equals a plain block.
  bool isEqual(const std::shared_ptr<RVRecognitionBlock>& other) const;
  bool isEqual(const RVRecognitionBlock* other) const;
  // "(98.50%) 'abc'": confidence with two decimals, then the text (nil prints "(null)").
  String description() const;

  // ---- Dictionary form (see the key constants above).

  // {"type": matchType, "text": text (absent when nil), "boundingBox": stringFromRect,
  //  "confidence": double, "level": level, "childBlocks": [children's dictionaries]}.
  // Trees deeper than kMaxTreeDepth are cut there (deeper children are written empty),
  // so even a block that is its own descendant gives a finite dictionary.
  PropertyList blockInformation() const;
  // Builds a tree from that form. Missing keys read as nil text, zero box, confidence 0,
  // level 0, no children; a text that is no string reads as nil; a malformed box string
  // reads as the zero box. Confidence is read through single precision (so 98.7 comes
  // back as 98.69999694824219) and level through 32 bits. "type" is not read: matchType
  // is 0 and lineSpacing spacingUndefined. Returns nullptr when `info` is not a
  // dictionary; such children, and children past kMaxTreeDepth, are skipped.
  static std::shared_ptr<RVRecognitionBlock> createBlockFromInfo(const PropertyList& info);
  static constexpr int kMaxTreeDepth = 64;
  // Whether the dictionary form nests no deeper than kMaxTreeDepth levels of
  // "childBlocks" below `info` (what blockInformation writes always does), so that
  // nothing of it would be cut. Time linear in the tree's size.
  static bool isWithinTreeDepth(const PropertyList& info);

  // The dictionary form in a property-list file (written atomically). Writing fails
  // (false) when the file cannot be written; reading gives nullptr for a missing file,
  // one that is no property list (see PropertyList's limits), one whose root is not a
  // dictionary, or one whose tree nests deeper than kMaxTreeDepth.
  bool writeToFile(const std::string& path, PropertyList::Format format) const;
  static std::shared_ptr<RVRecognitionBlock> readFromFile(const std::string& path);

  // ---- Geometry predicates (tolerances read at each call). R is a box; S is this
  // block's box; L the box of its last child.

  // R continues the last child to the right on its line: L.maxX < R.minX <
  // L.maxX + maxWordSeperation and R.minY >= L.minY + allowance. False without children.
  bool isSameLine(Rect rect) const;
  // R stands just below S, left-aligned: |R.minX - S.minX| < columnMatchAllowance and
  // S.minY - maxLineSeperation <= R.maxY <= S.minY.
  bool isSameColumn(Rect rect) const;
  // SameLine if isSameLine, else SameColumn if isSameColumn, else None.
  RVBlockMatchType isContinuous(Rect rect) const;
  // |S.minX - B.minX| < columnMatchAllowance (both bounds strict). False for nullptr.
  bool isBlockInColumn(const std::shared_ptr<RVRecognitionBlock>& block) const;
  // These three look only at their arguments (false when either is null).
  // A and B overlap vertically by at least half of B's height.
  bool isBlockOnSameLine(const std::shared_ptr<RVRecognitionBlock>& a,
                         const std::shared_ptr<RVRecognitionBlock>& b) const;
  // A starts at or right of B's right edge.
  bool isBlockOnAfterBlock(const std::shared_ptr<RVRecognitionBlock>& a,
                           const std::shared_ptr<RVRecognitionBlock>& b) const;
  // A's bottom is at or above B's top.
  bool isBlockAboveBlock(const std::shared_ptr<RVRecognitionBlock>& a,
                         const std::shared_ptr<RVRecognitionBlock>& b) const;

  // ---- Assembly and text. A null block argument is ignored.

  // Sets block's matchType to `continuous` (even when it is a child already, and then
  // stops); otherwise inserts it before the first child whose bottom is below its own
  // (else at the end), grows the box to the union and rebuilds the text.
  void addChildBlock(const std::shared_ptr<RVRecognitionBlock>& block, RVBlockMatchType continuous);
  // Merges a block into a column: into the first child it shares a line with (appended
  // or prepended to that child's text, "a b"), or before the first child it stands
  // above, or at the end. Only the last case grows this block's box. The text is rebuilt
  // unless the block was a child already (then nothing happens).
  void insertBlock(const std::shared_ptr<RVRecognitionBlock>& block);
  // text = "<text> <block text>" (append) or "<block text> <text>" (prepend); the box
  // grows to the union. Children and matchType are untouched.
  void appendBlock(const std::shared_ptr<RVRecognitionBlock>& block);
  void prependBlock(const std::shared_ptr<RVRecognitionBlock>& block);
  // Replaces the children by paragraphs cut where the gap between one child's bottom and
  // the next one's top reaches maxLineSeperation. Paragraph children present before are
  // kept in front. Each gap is stored as the upper child's lineSpacing; a closed
  // paragraph's lineSpacing is the running value s = (s + gap) / n (not a true mean);
  // the last paragraph keeps spacingUndefined. The text is not rebuilt.
  void buildParagraphs();
  // The children's texts joined: a line feed before a SameColumn child, nothing
  // otherwise. "" without children.
  String buildTextString() const;
  // The text split at every whitespace or newline character (empty pieces kept). When
  // the text holds CJK characters, pieces with CJK are split into one word per CJK unit,
  // with non-CJK runs before a CJK unit kept as words and a trailing non-CJK run dropped.
  std::vector<String> wordsInBlock() const;
  // Vertical when the text (two units or more) holds a CJK character and the box is
  // taller than wide.
  RVWritingDirection writingDirection() const;
  // For vertical text, one UTF-16 unit per line (a surrogate pair is split); else text.
  std::optional<String> textUsingWritingDirection() const;
  // The first child whose text equals `string`, or nullptr. With `remove`, every child
  // equal to it (isEqual) is removed from childBlocks.
  std::shared_ptr<RVRecognitionBlock> childBlockForString(const String& string, bool remove);

 protected:
  RVRecognitionBlock(std::optional<String> text, Rect boundingBox, double confidence,
                     RVRecognitionBlockLevel level);

 private:
  // What a container knows about its children while nothing has changed behind it, so
  // that a block added below all of them costs O(1): the text is extended instead of
  // rebuilt and the children are not rescanned. Defined in ocr/AssemblyCache.h.
  struct AssemblyCache;

  bool containsChild(const std::shared_ptr<RVRecognitionBlock>& block) const;
  void rebuildText();
  void setText(std::optional<String> text);
  void setBox(Rect box);
  // This block's text, box or match type changed: the caches of the containers that hold
  // it are stale.
  void changed();
  void watch(RVRecognitionBlock& child);
  void invalidateCache();
  void buildCache();
  bool appendBelowAll(const std::shared_ptr<RVRecognitionBlock>& block);

  std::optional<String> text_;
  double confidence_ = 0;
  RVRecognitionBlockLevel level_ = RVRecognitionBlockLevelLine;
  std::shared_ptr<RVBlockArray> childBlocks_;
  RVBlockMatchType matchType_ = RVBlockMatchNone;
  double lineSpacing_ = 0;
  Rect boundingBox_;
  std::uint64_t textHash_ = 0;  // kept with the text, so hash() only reads
  mutable std::atomic<bool> childrenShared_{false};
  std::unique_ptr<AssemblyCache> cache_;
  std::vector<std::weak_ptr<RVRecognitionBlock>> watchers_;
};

}  // namespace corvel
