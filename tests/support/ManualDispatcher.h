// A main-queue dispatcher that runs the work it receives only when the test drains it,
// so a test decides exactly when completions are delivered.
#pragma once

#include <deque>
#include <functional>
#include <mutex>

#include "Corvelbase/platform/OperationQueue.h"

namespace corvel::testing {

class ManualDispatcher final : public MainQueueDispatcher {
 public:
  void dispatch(std::function<void()> work) override {
    std::lock_guard lock(mutex_);
    work_.push_back(std::move(work));
  }
  // Runs what is pending (and what that work dispatches) on the calling thread; returns
  // how many blocks ran.
  std::size_t drain();
  std::size_t pending() const {
    std::lock_guard lock(mutex_);
    return work_.size();
  }

 private:
  mutable std::mutex mutex_;
  std::deque<std::function<void()>> work_;
};

}  // namespace corvel::testing
