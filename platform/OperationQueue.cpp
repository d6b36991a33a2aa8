#include "Corvelbase/platform/OperationQueue.h"

#include <algorithm>
#include <deque>
#include <thread>

#include "Corvelbase/platform/Platform.h"
#include "platform/Backends.h"

namespace corvel {

// --- Operation ----------------------------------------------------------------------

Operation::~Operation() = default;

void Operation::cancel() {
  std::lock_guard lock(mutex_);
  if (!finished_) cancelled_ = true;
}

bool Operation::isCancelled() const {
  std::lock_guard lock(mutex_);
  return cancelled_;
}

bool Operation::isExecuting() const {
  std::lock_guard lock(mutex_);
  return executing_;
}

bool Operation::isFinished() const {
  std::lock_guard lock(mutex_);
  return finished_;
}

void Operation::waitUntilFinished() const {
  std::unique_lock lock(mutex_);
  finishedChanged_.wait(lock, [this] { return finished_; });
}

void Operation::finishUnrun() {
  {
    std::lock_guard lock(mutex_);
    if (finished_ || executing_) return;
    cancelled_ = true;
    finished_ = true;
  }
  discard();
  finishedChanged_.notify_all();
}

void Operation::start() {
  bool run = false;
  {
    std::lock_guard lock(mutex_);
    if (finished_ || executing_) return;
    run = executing_ = !cancelled_;
  }
  if (!run) {
    finishUnrun();
    return;
  }
  main();
  std::lock_guard lock(mutex_);
  executing_ = false;
  finished_ = true;
  finishedChanged_.notify_all();
}

std::shared_ptr<BlockOperation> BlockOperation::blockOperationWithBlock(
    std::function<void()> block) {
  return std::shared_ptr<BlockOperation>(new BlockOperation(std::move(block)));
}

void BlockOperation::main() {
  if (block_) block_();
  block_ = nullptr;  // drop what the block captured as soon as it has run
}

// --- OperationQueue -----------------------------------------------------------------

// The workers and what they share; every field is guarded by `mutex`.
struct OperationQueue::Workers {
  std::mutex mutex;
  std::condition_variable changed;
  std::deque<std::shared_ptr<Operation>> waiting;
  std::vector<std::shared_ptr<Operation>> running;
  std::vector<std::thread> threads;
  std::size_t idle = 0;
  std::int64_t maxConcurrent = -1;
  bool stopping = false;

  // With `mutex` held: one worker per operation that may run now; workers stay for later
  // operations.
  void startIfNeeded() {
    std::size_t limit = maxConcurrent < 1 ? waiting.size() + running.size()
                                          : static_cast<std::size_t>(maxConcurrent);
    std::size_t wanted = std::min(limit, waiting.size() + running.size());
    while (threads.size() < wanted && idle < waiting.size()) {
      threads.emplace_back([this] { loop(); });
      ++idle;
    }
  }

  void loop() {
    std::unique_lock lock(mutex);
    for (;;) {
      changed.wait(lock, [this] {
        bool room = maxConcurrent < 1 || running.size() < static_cast<std::size_t>(maxConcurrent);
        return stopping || (room && !waiting.empty());
      });
      if (stopping) return;
      std::shared_ptr<Operation> operation = std::move(waiting.front());
      waiting.pop_front();
      running.push_back(operation);
      --idle;
      lock.unlock();
      operation->start();
      lock.lock();
      running.erase(std::find(running.begin(), running.end(), operation));
      ++idle;
      lock.unlock();
      operation.reset();  // release what the work captured outside the queue's lock
      lock.lock();
      changed.notify_all();
    }
  }
};

OperationQueue::OperationQueue() : workers_(std::make_unique<Workers>()) {}

std::shared_ptr<OperationQueue> OperationQueue::init() {
  return std::shared_ptr<OperationQueue>(new OperationQueue);
}

OperationQueue::~OperationQueue() {
  std::vector<std::thread> threads;
  std::deque<std::shared_ptr<Operation>> dropped;
  {
    std::lock_guard lock(workers_->mutex);
    workers_->stopping = true;
    dropped.swap(workers_->waiting);
    threads.swap(workers_->threads);
  }
  workers_->changed.notify_all();
  for (auto& operation : dropped) operation->finishUnrun();
  for (auto& thread : threads) thread.join();
}

void OperationQueue::setMaxConcurrentOperationCount(std::int64_t count) {
  std::lock_guard lock(workers_->mutex);
  workers_->maxConcurrent = count;
  workers_->startIfNeeded();
  workers_->changed.notify_all();
}

std::int64_t OperationQueue::maxConcurrentOperationCount() const {
  std::lock_guard lock(workers_->mutex);
  return workers_->maxConcurrent;
}

void OperationQueue::addOperation(std::shared_ptr<Operation> operation) {
  if (!operation) return;
  Workers& w = *workers_;
  std::lock_guard lock(w.mutex);
  if (w.stopping) return;
  bool known = std::find(w.waiting.begin(), w.waiting.end(), operation) != w.waiting.end() ||
               std::find(w.running.begin(), w.running.end(), operation) != w.running.end();
  if (known || operation->isFinished()) return;
  w.waiting.push_back(std::move(operation));
  w.startIfNeeded();
  w.changed.notify_all();
}

void OperationQueue::addOperationWithBlock(std::function<void()> block) {
  addOperation(BlockOperation::blockOperationWithBlock(std::move(block)));
}

void OperationQueue::cancelAllOperations() {
  std::lock_guard lock(workers_->mutex);
  for (auto& operation : workers_->waiting) operation->cancel();
  for (auto& operation : workers_->running) operation->cancel();
}

std::vector<std::shared_ptr<Operation>> OperationQueue::operations() const {
  std::lock_guard lock(workers_->mutex);
  std::vector<std::shared_ptr<Operation>> all(workers_->running.begin(), workers_->running.end());
  all.insert(all.end(), workers_->waiting.begin(), workers_->waiting.end());
  return all;
}

std::size_t OperationQueue::operationCount() const {
  std::lock_guard lock(workers_->mutex);
  return workers_->running.size() + workers_->waiting.size();
}

void OperationQueue::waitUntilAllOperationsAreFinished() const {
  Workers& w = *workers_;
  std::unique_lock lock(w.mutex);
  w.changed.wait(lock, [&w] { return w.waiting.empty() && w.running.empty(); });
}

// --- MainQueue ----------------------------------------------------------------------

MainQueueDispatcher::~MainQueueDispatcher() = default;

namespace {

// Work for the main thread when the host installed no dispatcher of its own.
class InternalMainQueue final : public MainQueueDispatcher {
 public:
  void dispatch(std::function<void()> work) override {
    {
      std::lock_guard lock(mutex_);
      pending_.push_back(std::move(work));
    }
    arrived_.notify_all();
  }

  std::function<void()> take() {
    std::lock_guard lock(mutex_);
    if (pending_.empty()) return nullptr;
    auto work = std::move(pending_.front());
    pending_.pop_front();
    return work;
  }

  // Waits until work is pending or `until` passes.
  void waitForWork(std::chrono::steady_clock::time_point until) {
    std::unique_lock lock(mutex_);
    arrived_.wait_until(lock, until, [this] { return !pending_.empty(); });
  }

 private:
  std::mutex mutex_;
  std::condition_variable arrived_;
  std::deque<std::function<void()>> pending_;
};

std::shared_ptr<InternalMainQueue> internalQueue() {
  static const auto* queue =  // never destroyed: used until exit
      new std::shared_ptr<InternalMainQueue>(std::make_shared<InternalMainQueue>());
  return *queue;
}

}  // namespace

std::shared_ptr<MainQueueDispatcher> detail::internalMainQueueDispatcher() {
  return internalQueue();
}

void MainQueue::async(std::function<void()> work) {
  if (!work) return;
  PlatformRegistry::mainQueueDispatcher()->dispatch(std::move(work));
}

std::size_t MainQueue::drain() {
  auto queue = internalQueue();
  std::size_t ran = 0;
  while (auto work = queue->take()) {
    work();
    ++ran;
  }
  return ran;
}

bool MainQueue::runUntil(const std::function<bool()>& done, std::chrono::milliseconds timeout) {
  auto queue = internalQueue();
  auto deadline = std::chrono::steady_clock::now() + timeout;
  for (;;) {
    while (auto work = queue->take()) {
      work();
      if (done && done()) return true;
    }
    if (done && done()) return true;
    auto now = std::chrono::steady_clock::now();
    if (now >= deadline) return false;
    // Wake now and then: `done` may also change through work that bypasses this queue.
    queue->waitForWork(std::min(deadline, now + std::chrono::milliseconds(20)));
  }
}

}  // namespace corvel
