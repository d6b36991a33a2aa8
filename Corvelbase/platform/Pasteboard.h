// The general pasteboard: a list of items, each holding data under one or more type
// strings (its representations, in the order they were added).
//
// The default pasteboard lives in this process only (MemoryPasteboard). A host that wants
// cut and paste to reach other programs installs a backend on its toolkit's clipboard
// with PlatformRegistry::setGeneralPasteboard. Every call is safe from any thread.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "Corvelbase/Export.h"
#include "Corvelbase/platform/String.h"

namespace corvel {

struct CORVEL_EXPORT PasteboardItem {
  std::vector<std::pair<std::string, Data>> representations;

  // The data for `type`, or nullopt. Types compare exactly.
  std::optional<Data> dataForType(const std::string& type) const;
  // Replaces the representation of `type`, or adds it after the others.
  void setData(Data data, const std::string& type);
  std::vector<std::string> types() const;
};

class CORVEL_EXPORT Pasteboard {
 public:
  virtual ~Pasteboard();

  // The general pasteboard in use (the registry's, or the process-local default).
  static std::shared_ptr<Pasteboard> general();

  // Removes every item; returns the new change count.
  virtual std::int64_t clearContents() = 0;
  // Replaces the contents with `items`.
  virtual void writeItems(std::vector<PasteboardItem> items) = 0;
  // Sets `data` for `type` on the first item, beside the types it already has (an empty
  // pasteboard gets a first item). Returns false when the backend refuses.
  virtual bool setData(const Data& data, const std::string& type) = 0;
  // The data for `type` of the first item that has it, or nullopt.
  virtual std::optional<Data> dataForType(const std::string& type) const = 0;
  virtual std::vector<PasteboardItem> items() const = 0;
  // Increases with every change of the contents.
  virtual std::int64_t changeCount() const = 0;
};

// A pasteboard in this process's memory.
class CORVEL_EXPORT MemoryPasteboard : public Pasteboard {
 public:
  std::int64_t clearContents() override;
  void writeItems(std::vector<PasteboardItem> items) override;
  bool setData(const Data& data, const std::string& type) override;
  std::optional<Data> dataForType(const std::string& type) const override;
  std::vector<PasteboardItem> items() const override;
  std::int64_t changeCount() const override;

 private:
  mutable std::mutex mutex_;
  std::vector<PasteboardItem> items_;
  std::int64_t changeCount_ = 0;
};

}  // namespace corvel
