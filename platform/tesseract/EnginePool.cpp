#include "platform/tesseract/EnginePool.h"

#include <chrono>
#include <filesystem>
#include <sstream>
#include <vector>

namespace corvel::detail {

EnginePool::EnginePool(std::string dataPath, std::uint64_t maxIdleModelBytes)
    : dataPath_(std::move(dataPath)), maxIdleModelBytes_(maxIdleModelBytes) {}

EnginePool::~EnginePool() { clear(); }

std::uint64_t EnginePool::modelBytes(const std::string& languages) const {
  std::uint64_t total = 0;
  std::stringstream list(languages);
  std::string model;
  while (std::getline(list, model, '+')) {
    std::error_code ec;
    auto size = std::filesystem::file_size(dataPath_ + "/" + model + ".traineddata", ec);
    if (ec) return 0;
    total += size;
  }
  return total;
}

std::unique_ptr<Engine> EnginePool::acquire(const EngineKey& key, std::string* failure,
                                            double* startSeconds) {
  if (startSeconds) *startSeconds = 0;
  {
    std::lock_guard lock(mutex_);
    for (auto it = idle_.begin(); it != idle_.end(); ++it) {
      if ((*it)->key == key) {
        std::unique_ptr<Engine> engine = std::move(*it);
        idle_.erase(it);
        idleBytes_ -= engine->modelBytes;
        return engine;
      }
    }
  }
  std::uint64_t bytes = modelBytes(key.languages);
  if (bytes == 0) {
    *failure = "the language data \"" + key.languages + "\" is not installed in " + dataPath_;
    return nullptr;
  }
  auto started = std::chrono::steady_clock::now();
  auto engine = std::make_unique<Engine>();
  engine->key = key;
  engine->modelBytes = bytes;
  // Tesseract's own messages would go to standard error; the library reports through
  // its error objects instead.
  std::vector<std::string> names{"debug_file"};
  std::vector<std::string> values{"/dev/null"};
  if (!key.dictionary) {
    names.insert(names.end(), {"load_system_dawg", "load_freq_dawg"});
    values.insert(values.end(), {"0", "0"});
  }
  bool osd = key.languages == "osd";
  int status = 0;
  {
    // Starting an engine also writes Tesseract's process-wide parameters (where its
    // messages go, among others): engines start one at a time.
    static std::mutex starting;
    std::lock_guard lock(starting);
    status = engine->api.Init(dataPath_.c_str(), key.languages.c_str(),
                              osd ? tesseract::OEM_TESSERACT_ONLY : tesseract::OEM_LSTM_ONLY,
                              nullptr, 0, &names, &values, false);
  }
  if (startSeconds) {
    *startSeconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - started).count();
  }
  if (status != 0) {
    *failure = "the recognition engine could not start with \"" + key.languages + "\"";
    return nullptr;
  }
  return engine;
}

void EnginePool::release(std::unique_ptr<Engine> engine) {
  if (!engine) return;
  engine->api.Clear();
  std::list<std::unique_ptr<Engine>> evicted;
  {
    std::lock_guard lock(mutex_);
    idleBytes_ += engine->modelBytes;
    idle_.push_front(std::move(engine));
    // Keep at least the engine just returned: the next job most likely wants it.
    while (idleBytes_ > maxIdleModelBytes_ && idle_.size() > 1) {
      idleBytes_ -= idle_.back()->modelBytes;
      evicted.push_back(std::move(idle_.back()));
      idle_.pop_back();
    }
  }
  // Stopping an engine frees its models; done outside the lock.
  for (auto& stopped : evicted) stopped->api.End();
}

void EnginePool::clear() {
  std::list<std::unique_ptr<Engine>> stopped;
  {
    std::lock_guard lock(mutex_);
    stopped.swap(idle_);
    idleBytes_ = 0;
  }
  for (auto& engine : stopped) engine->api.End();
}

std::size_t EnginePool::idleCount() const {
  std::lock_guard lock(mutex_);
  return idle_.size();
}

}  // namespace corvel::detail
