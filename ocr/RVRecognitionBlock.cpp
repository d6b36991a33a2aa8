// The block record: initialisers, geometry of the record, equality and the dictionary form.
#include "Corvelbase/RVRecognitionBlock.h"

#include <cxxabi.h>

#include <cfloat>
#include <cmath>
#include <cstdio>
#include <typeinfo>
#include <utility>
#include <vector>

#include "Corvelbase/platform/Files.h"
#include "ocr/AssemblyCache.h"

namespace corvel {

double maxWordSeperation = 0.005;
double maxLineSeperation = 0.005;
double allowance = 0.0006;
double columnMatchAllowance = 0.015;
double spacingUndefined = -1000.0;

const char* const kRVBlockTypeKey = "type";
const char* const kRVBlockTextKey = "text";
const char* const kRVBlockBoundingBoxKey = "boundingBox";
const char* const kRVBlockConfidenceKey = "confidence";
const char* const kRVBlockLevelKey = "level";
const char* const kRVBlockChildBlocksKey = "childBlocks";

namespace {

constexpr std::size_t kChildCapacity = 10;

// Whether the class `derived` is `base` or derives from it. Read from the C++ runtime's
// own class descriptions (the Itanium ABI of every Linux compiler), so that a host's
// subclass of a block needs to declare nothing for equality to see its class.
bool isSameOrDerived(const std::type_info& derived, const std::type_info& base) {
  if (derived == base) return true;
  if (auto* single = dynamic_cast<const abi::__si_class_type_info*>(&derived))
    return isSameOrDerived(*single->__base_type, base);
  if (auto* multiple = dynamic_cast<const abi::__vmi_class_type_info*>(&derived)) {
    for (unsigned i = 0; i < multiple->__base_count; ++i)
      if (isSameOrDerived(*multiple->__base_info[i].__base_type, base)) return true;
  }
  return false;
}

std::shared_ptr<RVBlockArray> newChildArray() {
  auto array = std::make_shared<RVBlockArray>();
  array->reserve(kChildCapacity);
  return array;
}

// Truncation to unsigned 64 bits, saturating where a plain cast would be undefined.
std::uint64_t truncateToUnsigned(double value) {
  if (!(value > 0)) return 0;  // also NaN
  if (value >= 18446744073709551616.0) return UINT64_MAX;
  return static_cast<std::uint64_t>(value);
}

std::shared_ptr<RVRecognitionBlock> blockFromInfo(const PropertyList& info, int depth) {
  const PropertyList::Dictionary* dict = info.dictionary();
  if (!dict || depth > RVRecognitionBlock::kMaxTreeDepth) return nullptr;
  std::optional<String> text;
  if (const PropertyList* t = info.find(kRVBlockTextKey); t && t->string()) text = *t->string();
  Rect box = RectZero;
  if (const PropertyList* b = info.find(kRVBlockBoundingBoxKey); b && b->string())
    box = rectFromString(toUTF8(*b->string()));
  double confidence = 0;
  if (const PropertyList* c = info.find(kRVBlockConfidenceKey))
    confidence = static_cast<double>(c->floatValue());
  std::uint32_t level = 0;
  if (const PropertyList* l = info.find(kRVBlockLevelKey)) level = l->unsignedIntValue();
  auto block = RVRecognitionBlock::initWithText(std::move(text), box, confidence,
                                                static_cast<RVRecognitionBlockLevel>(level));
  const PropertyList* children = info.find(kRVBlockChildBlocksKey);
  if (block && children && children->array()) {
    for (const PropertyList& childInfo : *children->array()) {
      if (auto child = blockFromInfo(childInfo, depth + 1)) block->childBlocks()->push_back(child);
    }
  }
  return block;
}

PropertyList informationOf(const RVRecognitionBlock& block, int depth) {
  PropertyList::Dictionary dict;
  dict[kRVBlockTypeKey] = PropertyList(static_cast<std::uint64_t>(block.matchType()));
  if (block.text()) dict[kRVBlockTextKey] = PropertyList(*block.text());
  dict[kRVBlockBoundingBoxKey] = PropertyList(fromUTF8(stringFromRect(block.boundingBox())));
  dict[kRVBlockConfidenceKey] = PropertyList(block.confidence());
  dict[kRVBlockLevelKey] = PropertyList(static_cast<std::uint64_t>(block.level()));
  PropertyList::Array children;
  if (depth < RVRecognitionBlock::kMaxTreeDepth) {
    children.reserve(block.children().size());
    for (const auto& child : block.children()) {
      if (child) children.push_back(informationOf(*child, depth + 1));
    }
  }
  dict[kRVBlockChildBlocksKey] = PropertyList(std::move(children));
  return PropertyList(std::move(dict));
}

}  // namespace

RVRecognitionBlock::RVRecognitionBlock(std::optional<String> text, Rect boundingBox,
                                       double confidence, RVRecognitionBlockLevel level)
    : text_(std::move(text)),
      confidence_(confidence),
      level_(level),
      childBlocks_(newChildArray()),
      matchType_(RVBlockMatchNone),
      lineSpacing_(spacingUndefined),
      boundingBox_(boundingBox),
      textHash_(textHash(text_)) {}

RVRecognitionBlock::~RVRecognitionBlock() = default;

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::initWithText(
    std::optional<String> text, Rect boundingBox, double confidence,
    RVRecognitionBlockLevel level) {
  return std::shared_ptr<RVRecognitionBlock>(
      new RVRecognitionBlock(std::move(text), boundingBox, confidence, level));
}

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::initColumnWithBlock(
    const std::shared_ptr<RVRecognitionBlock>& block) {
  if (!block) return nullptr;
  auto column = initWithText(block->text(), block->boundingBox(), block->confidence(),
                             RVRecognitionBlockLevelColumn);
  column->childBlocks_->push_back(block);
  return column;
}

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::initParagraphWithBlock(
    const std::shared_ptr<RVRecognitionBlock>& block) {
  if (!block) return nullptr;
  auto paragraph = initWithText(block->text(), block->boundingBox(), block->confidence(),
                                RVRecognitionBlockLevelParagraph);
  paragraph->childBlocks_->push_back(block);
  return paragraph;
}

void RVRecognitionBlock::setChildBlocks(std::shared_ptr<RVBlockArray> childBlocks) {
  // The caller keeps the array it gave us, so it is shared from now on.
  childrenShared_.store(true, std::memory_order_relaxed);
  invalidateCache();
  childBlocks_ = childBlocks ? std::move(childBlocks) : newChildArray();
}

void RVRecognitionBlock::setBoundingBox(Rect boundingBox, std::uint64_t forOrigin) {
  if (forOrigin == RVBoundingBoxOriginTopLeft)
    boundingBox.origin.y = 1.0 - (boundingBox.origin.y + boundingBox.size.height);
  setBox(boundingBox);
}

void RVRecognitionBlock::setMatchType(RVBlockMatchType matchType) {
  matchType_ = matchType;
  changed();
}

Rect RVRecognitionBlock::boundingBoxAtImageOfSize(Size size) const {
  return Rect{size.width * rectGetMinX(boundingBox_), size.height * rectGetMinY(boundingBox_),
              size.width * boundingBox_.size.width, size.height * boundingBox_.size.height};
}

double RVRecognitionBlock::lineSpacingForHeight(double height) const {
  return lineSpacing_ * height;
}

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::copy() { return shared_from_this(); }

std::uint64_t RVRecognitionBlock::hash() const {
  return static_cast<std::uint64_t>(level_) + truncateToUnsigned(confidence_ * 10000.0) * 11813u +
         textHash_ * 13411u;
}

bool RVRecognitionBlock::isEqual(const std::shared_ptr<RVRecognitionBlock>& other) const {
  return isEqual(other.get());
}

bool RVRecognitionBlock::isEqual(const RVRecognitionBlock* other) const {
  if (other == this) return true;
  if (!other) return false;
  // `other` of this block's class or a subclass: a plain block may equal an instance of a
  // host's subclass, but that instance never equals a plain block.
  if (!isSameOrDerived(typeid(*other), typeid(*this))) return false;
  if (hash() != other->hash()) return false;
  if (level_ != other->level_) return false;
  if (!(std::fabs(confidence_ - other->confidence_) < static_cast<double>(FLT_EPSILON)))
    return false;
  if (!(boundingBox_ == other->boundingBox_)) return false;
  return text_ == other->text_;
}

String RVRecognitionBlock::description() const {
  char number[64];
  std::snprintf(number, sizeof number, "%.2f", confidence_);
  // Built by appending: GCC 12 at -O3 misreads a chain of operator+ here (-Wrestrict).
  String result(u"(");
  result.append(fromUTF8(number)).append(u"%) '").append(text_ ? *text_ : u"(null)");
  result.push_back(u'\'');
  return result;
}

PropertyList RVRecognitionBlock::blockInformation() const { return informationOf(*this, 0); }

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::createBlockFromInfo(
    const PropertyList& info) {
  return blockFromInfo(info, 0);
}

bool RVRecognitionBlock::writeToFile(const std::string& path, PropertyList::Format format) const {
  return blockInformation().writeToFile(path, format);
}

bool RVRecognitionBlock::isWithinTreeDepth(const PropertyList& info) {
  // Walked with an explicit stack: the dictionary may come from anywhere.
  std::vector<std::pair<const PropertyList*, int>> pending{{&info, 0}};
  while (!pending.empty()) {
    auto [node, depth] = pending.back();
    pending.pop_back();
    const PropertyList* children = node->find(kRVBlockChildBlocksKey);
    if (!children || !children->array()) continue;
    for (const PropertyList& child : *children->array()) {
      if (!child.dictionary()) continue;
      if (depth + 1 > kMaxTreeDepth) return false;
      pending.emplace_back(&child, depth + 1);
    }
  }
  return true;
}

std::shared_ptr<RVRecognitionBlock> RVRecognitionBlock::readFromFile(const std::string& path) {
  std::optional<PropertyList> info = PropertyList::readFromFile(path);
  if (!info || !isWithinTreeDepth(*info)) return nullptr;
  return createBlockFromInfo(*info);
}

}  // namespace corvel
