// The shortcuts that keep a page's analysis linear must give exactly what the plain
// algorithms give. Random pages and random assembly sequences are checked step by step
// against straightforward computations made here.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <random>

#include "BlockTestHelpers.h"
#include "Corvelbase/RVTextLayoutAnalyser.h"

namespace corvel {
namespace {

using testing::line;
using testing::text;
using testing::TunableGuard;

using Block = std::shared_ptr<RVRecognitionBlock>;

// The plain insertion rule for a block that is no child yet: before the first child whose
// bottom lies below the block's.
void referenceAdd(std::vector<Block>& children, const Block& block) {
  double bottom = rectGetMinY(block->boundingBox());
  auto at = std::find_if(children.begin(), children.end(),
                         [&](const Block& c) { return rectGetMinY(c->boundingBox()) < bottom; });
  children.insert(at, block);
}

TEST(LayoutEquivalence, AddingChildrenMatchesThePlainRebuild) {
  std::mt19937 random(7);
  std::uniform_real_distribution<double> unit(0, 1);
  auto any = [&](const std::vector<Block>& blocks) { return blocks[random() % blocks.size()]; };
  for (int round = 0; round < 40; ++round) {
    auto first = line("first", 0.1, 0.95, 0.3, 0.01);
    auto container = RVRecognitionBlock::initColumnWithBlock(first);
    std::vector<Block> shadow = {first};
    Rect box = first->boundingBox();
    double y = 0.95;
    for (int step = 0; step < 120; ++step) {
      SCOPED_TRACE("round " + std::to_string(round) + " step " + std::to_string(step));
      double pick = unit(random), kind = unit(random);
      std::string name = std::to_string(step);
      if (pick < 0.75) {
        // Mostly top to bottom; sometimes higher up, a duplicate, a twin by value or NaN.
        Block block;
        if (kind < 0.8) {
          block = line("l" + name, 0.1, y -= 0.004 + 0.01 * unit(random), 0.3, 0.01, 90);
        } else if (kind < 0.88) {
          block = line("h" + name, 0.1, y + unit(random) * 0.5, 0.3, 0.01, 90);
        } else if (kind < 0.94) {
          block = any(shadow);
        } else if (kind < 0.97) {
          const Block c = any(shadow);
          block = RVRecognitionBlock::initWithText(c->text(), c->boundingBox(), c->confidence(),
                                                   c->level());
        } else {
          block = line("nan" + name, 0.1, std::nan(""), 0.3, 0.01);
        }
        auto type = static_cast<RVBlockMatchType>(random() % 3);
        bool present = std::any_of(shadow.begin(), shadow.end(),
                                   [&](const Block& c) { return c->isEqual(block); });
        std::optional<String> before = container->text();
        container->addChildBlock(block, type);
        ASSERT_EQ(block->matchType(), type);
        if (present) {
          ASSERT_EQ(container->text(), before);
          continue;
        }
        referenceAdd(shadow, block);
        box = rectUnion(box, block->boundingBox());
        ASSERT_EQ(container->children(), shadow);
        ASSERT_EQ(container->text(), container->buildTextString());
        ASSERT_EQ(container->boundingBox(), box);
        // The hash carried along with the text equals one computed afresh.
        ASSERT_EQ(container->hash(),
                  RVRecognitionBlock::initWithText(container->text(), box, container->confidence(),
                                                   container->level())
                      ->hash());
      } else if (pick < 0.85) {
        // Children change behind the container's back.
        any(shadow)->setMatchType(static_cast<RVBlockMatchType>(random() % 3));
      } else if (pick < 0.92) {
        any(shadow)->appendBlock(line("more", 0.45, y, 0.1, 0.01));
      } else if (pick < 0.96) {
        const Block c = any(shadow);
        Rect moved = c->boundingBox();
        moved.origin.y -= 0.2 * kind;
        c->setBoundingBox(moved, RVBoundingBoxOriginBottomLeft);
      } else if (round % 4 == 0) {
        // Direct edits of the array (only in some rounds: they end the shortcut for good).
        container->childBlocks()->push_back(line("pushed", 0.1, 0.99, 0.3, 0.01));
        shadow.push_back(container->children().back());
      }
    }
  }
}

// Each paragraph as its lines ("text/matchType") and its box. Boxes go in as text, since
// NaN boxes compare unequal to themselves.
std::vector<std::string> describe(const RVBlockArray& paragraphs) {
  std::vector<std::string> out;
  for (const auto& p : paragraphs) {
    std::string& d = out.emplace_back(stringFromRect(p->boundingBox()));
    for (const auto& l : p->children()) d += " " + text(l) + "/" + std::to_string(l->matchType());
  }
  return out;
}

// Paragraph building by the plain algorithm: every paragraph asked in order.
std::vector<std::string> referenceParagraphs(const RVBlockArray& lines) {
  auto analyser = RVTextLayoutAnalyser::init();
  RVBlockArray paragraphs;
  for (const auto& original : lines) {
    auto l = RVRecognitionBlock::initWithText(original->text(), original->boundingBox(),
                                              original->confidence(), original->level());
    RVBlockMatchType type = RVBlockMatchNone;
    if (auto p = analyser->isContinuous(l, paragraphs, &type)) {
      p->addChildBlock(l, type);
      continue;
    }
    auto p = RVRecognitionBlock::initWithText(u"", l->boundingBox(), l->confidence(),
                                              RVRecognitionBlockLevelParagraph);
    p->addChildBlock(l, RVBlockMatchNone);
    paragraphs.push_back(p);
  }
  return describe(paragraphs);
}

TEST(LayoutEquivalence, ParagraphBuildingMatchesAskingEveryParagraph) {
  std::mt19937 random(11);
  std::uniform_real_distribution<double> unit(0, 1);
  for (int round = 0; round < 60; ++round) {
    TunableGuard guardLine{maxLineSeperation}, guardWord{maxWordSeperation},
        guardAllowance{allowance};
    if (round % 3 == 1) {
      maxLineSeperation = 0.002 + 0.01 * unit(random);
      maxWordSeperation = 0.02 * unit(random);
      allowance = 0.002 * (unit(random) - 0.3);
    } else if (round % 3 == 2) {
      // A negative line gap rules out same-column matches: only same-line ones remain.
      maxLineSeperation = -0.01 * unit(random);
    }
    // One column: mostly lines going down with small gaps, some words on the same line,
    // some lines out of place, odd heights and the occasional NaN.
    RVBlockArray lines;
    double y = 0.95;
    for (int i = 0; i < 300; ++i) {
      double kind = unit(random), x = 0.1 + 0.01 * unit(random), h = 0.008 + 0.01 * unit(random);
      std::string name = "l" + std::to_string(i);
      if (kind < 0.7) {
        y -= h + 0.008 * unit(random);
        lines.push_back(line(name, x, y, 0.3, h));
      } else if (kind < 0.85 && !lines.empty()) {
        Rect last = lines.back()->boundingBox();
        lines.push_back(line(name, rectGetMaxX(last) + 0.004 * unit(random),
                             last.origin.y + 0.002 * unit(random), 0.1, h));
      } else if (kind < 0.97) {
        lines.push_back(line(name, x, unit(random), 0.3, h * (unit(random) < 0.1 ? -1 : 1)));
      } else {
        lines.push_back(line(name, x, std::nan(""), 0.3, unit(random) < 0.5 ? std::nan("") : h));
      }
    }
    auto want = referenceParagraphs(lines);
    auto column = RVRecognitionBlock::initWithText(u"", Rect{}, 0, RVRecognitionBlockLevelColumn);
    column->childBlocks()->assign(lines.begin(), lines.end());
    RVTextLayoutAnalyser::init()->buildParagraphBlocks(column);
    ASSERT_EQ(describe(column->children()), want) << "round " << round;
  }
}

}  // namespace
}  // namespace corvel
