#include "support/ManualDispatcher.h"

namespace corvel::testing {

void ManualDispatcher::dispatch(std::function<void()> work) {
  std::lock_guard lock(mutex_);
  work_.push_back(std::move(work));
}

std::size_t ManualDispatcher::drain() {
  std::size_t ran = 0;
  for (;;) {
    std::function<void()> next;
    {
      std::lock_guard lock(mutex_);
      if (work_.empty()) return ran;
      next = std::move(work_.front());
      work_.pop_front();
    }
    next();
    ++ran;
  }
}

std::size_t ManualDispatcher::pending() const {
  std::lock_guard lock(mutex_);
  return work_.size();
}

}  // namespace corvel::testing
