// RVTextLayoutAnalyser: groups the recognised lines of one page into columns and
// paragraphs and gives the page's reading-order text.
//
//   auto analyser = corvel::RVTextLayoutAnalyser::init();
//   for (auto& line : lines) analyser->addRecognitionBlock(line);   // level-2 blocks
//   analyser->analyse({width, height}, 0);
//   corvel::String text = analyser->text();        // columns joined by "\n\n"
//   auto columns = analyser->layoutBlocks();       // columns -> paragraphs -> lines
//
// Columns are made from left edges (within columnMatchAllowance), lone-line columns lying
// inside another column are folded into it, and columns are ordered top to bottom (side by
// side columns keep their left-to-right order). Inside each column, lines continue the
// earliest-opened paragraph that accepts them (same line, or the next line below).
//
// CAVEAT: `text()` is computed once and then frozen. Asking for it before analyse()
// caches the unanalysed blocks' texts; set setOrderedText(std::nullopt) to recompute.
//
// One analyser belongs to one thread at a time; it has no locks.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "Corvelbase/Export.h"
#include "Corvelbase/RVRecognitionBlock.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

// Orders two columns for reading: -1 when a lies wholly above b, 1 when wholly below,
// 0 when their vertical extents overlap or touch. Not transitive over chains of partly
// overlapping columns; the analyser sorts with it stably. `context` is unused. Null
// columns compare as 0.
CORVEL_EXPORT std::int64_t compareColumns(const std::shared_ptr<RVRecognitionBlock>& a,
                                          const std::shared_ptr<RVRecognitionBlock>& b,
                                          void* context);

class CORVEL_EXPORT RVTextLayoutAnalyser {
 public:
  static std::shared_ptr<RVTextLayoutAnalyser> init();

  RVTextLayoutAnalyser(const RVTextLayoutAnalyser&) = delete;
  RVTextLayoutAnalyser& operator=(const RVTextLayoutAnalyser&) = delete;

  // Appends to textBlocks with no check (a null block is ignored).
  void addRecognitionBlock(std::shared_ptr<RVRecognitionBlock> block);
  void addRecognitionBlocks(const RVBlockArray& blocks);

  // Builds columns from textBlocks (replacing any earlier columnBlocks), cleans and sorts
  // them, then builds each column's paragraphs. textBlocks and the cached text are left
  // alone. The size and direction are accepted and ignored: the analysis works in the
  // blocks' normalised coordinates whatever the writing direction.
  void analyse(Size imageSize, std::int64_t writingDirection);

  // The live columnBlocks array; nullptr before analysis, empty for an empty page.
  std::shared_ptr<RVBlockArray> layoutBlocks() const { return columnBlocks_; }

  // The reading-order text, cached at the first call (see CAVEAT above): the texts of
  // columnBlocks when analysed, else of textBlocks, joined by textFromBlocks().
  String text();
  // Texts joined by "\n\n"; the separator goes in only when the text so far is not
  // empty, so an empty text after a non-empty one doubles the next separator.
  String textFromBlocks(const RVBlockArray& blocks) const;

  // ---- The stages, as analyse() calls them; public for hosts that run them one by one.
  void buildColumns();
  void sanitizeColumns();
  // The first column (array order) whose isBlockInColumn holds for `block`, else
  // NotFound (as a signed value).
  std::int64_t blockMatches(const std::shared_ptr<RVRecognitionBlock>& block,
                            const RVBlockArray& inColumns) const;
  void buildParagraphs();
  void buildParagraphBlocks(const std::shared_ptr<RVRecognitionBlock>& column);
  // The earliest paragraph that accepts `block` (isContinuous != None), writing the match
  // type to *matchType (when given); nullptr, leaving *matchType alone, when none does.
  std::shared_ptr<RVRecognitionBlock> isContinuous(const std::shared_ptr<RVRecognitionBlock>& block,
                                                   const RVBlockArray& blocks,
                                                   RVBlockMatchType* matchType) const;

  // ---- Plain accessors.
  const std::shared_ptr<RVBlockArray>& textBlocks() const { return textBlocks_; }
  void setTextBlocks(std::shared_ptr<RVBlockArray> blocks);
  const std::shared_ptr<RVBlockArray>& columnBlocks() const { return columnBlocks_; }
  void setColumnBlocks(std::shared_ptr<RVBlockArray> blocks) { columnBlocks_ = std::move(blocks); }
  const std::optional<String>& orderedText() const { return orderedText_; }
  void setOrderedText(std::optional<String> text) { orderedText_ = std::move(text); }

 protected:
  RVTextLayoutAnalyser();

 private:
  std::shared_ptr<RVBlockArray> textBlocks_;
  std::shared_ptr<RVBlockArray> columnBlocks_;
  std::optional<String> orderedText_;
};

}  // namespace corvel
