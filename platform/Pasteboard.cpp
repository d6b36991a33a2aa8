#include "Corvelbase/platform/Pasteboard.h"

#include "Corvelbase/platform/Platform.h"

namespace corvel {

std::optional<Data> PasteboardItem::dataForType(const std::string& type) const {
  for (const auto& [t, data] : representations) {
    if (t == type) return data;
  }
  return std::nullopt;
}

void PasteboardItem::setData(Data data, const std::string& type) {
  for (auto& [t, existing] : representations) {
    if (t == type) {
      existing = std::move(data);
      return;
    }
  }
  representations.emplace_back(type, std::move(data));
}

std::vector<std::string> PasteboardItem::types() const {
  std::vector<std::string> out;
  for (const auto& representation : representations) out.push_back(representation.first);
  return out;
}

Pasteboard::~Pasteboard() = default;

std::shared_ptr<Pasteboard> Pasteboard::general() { return PlatformRegistry::generalPasteboard(); }

std::int64_t MemoryPasteboard::clearContents() {
  std::lock_guard lock(mutex_);
  items_.clear();
  return ++changeCount_;
}

void MemoryPasteboard::writeItems(std::vector<PasteboardItem> items) {
  std::lock_guard lock(mutex_);
  items_ = std::move(items);
  ++changeCount_;
}

bool MemoryPasteboard::setData(const Data& data, const std::string& type) {
  std::lock_guard lock(mutex_);
  if (items_.empty()) items_.emplace_back();
  items_.front().setData(data, type);
  ++changeCount_;
  return true;
}

std::optional<Data> MemoryPasteboard::dataForType(const std::string& type) const {
  std::lock_guard lock(mutex_);
  for (const auto& item : items_) {
    if (auto data = item.dataForType(type)) return data;
  }
  return std::nullopt;
}

std::vector<PasteboardItem> MemoryPasteboard::items() const {
  std::lock_guard lock(mutex_);
  return items_;
}

std::int64_t MemoryPasteboard::changeCount() const {
  std::lock_guard lock(mutex_);
  return changeCount_;
}

}  // namespace corvel
