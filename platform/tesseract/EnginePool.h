// Internal: a pool of started Tesseract engines.
//
// Starting an engine reads its models (a tenth of a second for English, more than a
// second for all our languages together), while reusing one costs nothing, so engines
// are kept after use and handed to the next recognition with the same languages and
// dictionary setting. One engine serves one recognition at a time. Idle engines are
// stopped, least recently used first, while their models add up to more than a cap.
// Thread-safe.
#pragma once

#include <cstdint>
#include <list>
#include <memory>
#include <mutex>
#include <string>

#include <tesseract/baseapi.h>

namespace corvel::detail {

struct EngineKey {
  std::string languages;   // Tesseract's form: "eng", "eng+fra", "osd"
  bool dictionary = true;  // language correction; fixed when the engine starts
  friend bool operator==(const EngineKey&, const EngineKey&) = default;
};

struct Engine {
  EngineKey key;
  std::uint64_t modelBytes = 0;
  tesseract::TessBaseAPI api;
};

class EnginePool {
 public:
  EnginePool(std::string dataPath, std::uint64_t maxIdleModelBytes);
  ~EnginePool();
  EnginePool(const EnginePool&) = delete;
  EnginePool& operator=(const EnginePool&) = delete;

  // An idle engine for `key`, or a newly started one; nullptr with *failure set when
  // the engine cannot start. `startSeconds` (if given) receives the time spent starting.
  std::unique_ptr<Engine> acquire(const EngineKey& key, std::string* failure, double* startSeconds);
  // Takes the engine back for reuse (its page results cleared).
  void release(std::unique_ptr<Engine> engine);
  // Stops every idle engine.
  void clear();

  std::size_t idleCount() const;
  const std::string& dataPath() const { return dataPath_; }
  // On-disk size of the models a key loads; 0 when one is missing.
  std::uint64_t modelBytes(const std::string& languages) const;

 private:
  std::string dataPath_;
  std::uint64_t maxIdleModelBytes_;
  mutable std::mutex mutex_;
  std::list<std::unique_ptr<Engine>> idle_;  // most recently used first
  std::uint64_t idleBytes_ = 0;
};

}  // namespace corvel::detail
