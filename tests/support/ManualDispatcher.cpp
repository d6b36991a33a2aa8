#include "support/ManualDispatcher.h"

namespace corvel::testing {

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

}  // namespace corvel::testing
