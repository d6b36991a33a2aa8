#include "Corvelbase/platform/OperationQueue.h"

#include <algorithm>

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

std::shared_ptr<OperationQueue> OperationQueue::init() {
  return std::shared_ptr<OperationQueue>(new OperationQueue);
}

OperationQueue::~OperationQueue() {
  std::vector<std::thread> workers;
  std::deque<std::shared_ptr<Operation>> dropped;
  {
    std::lock_guard lock(mutex_);
    stopping_ = true;
    dropped.swap(waiting_);
    workers.swap(workers_);
  }
  changed_.notify_all();
  for (auto& operation : dropped) operation->finishUnrun();
  for (auto& worker : workers) worker.join();
}

void OperationQueue::setMaxConcurrentOperationCount(std::int64_t count) {
  std::lock_guard lock(mutex_);
  maxConcurrent_ = count;
  startWorkersIfNeeded();
  changed_.notify_all();
}

std::int64_t OperationQueue::maxConcurrentOperationCount() const {
  std::lock_guard lock(mutex_);
  return maxConcurrent_;
}

void OperationQueue::addOperation(std::shared_ptr<Operation> operation) {
  if (!operation) return;
  std::lock_guard lock(mutex_);
  if (stopping_) return;
  bool known = std::find(waiting_.begin(), waiting_.end(), operation) != waiting_.end() ||
               std::find(running_.begin(), running_.end(), operation) != running_.end();
  if (known || operation->isFinished()) return;
  waiting_.push_back(std::move(operation));
  startWorkersIfNeeded();
  changed_.notify_all();
}

void OperationQueue::addOperationWithBlock(std::function<void()> block) {
  addOperation(BlockOperation::blockOperationWithBlock(std::move(block)));
}

void OperationQueue::cancelAllOperations() {
  std::lock_guard lock(mutex_);
  for (auto& operation : waiting_) operation->cancel();
  for (auto& operation : running_) operation->cancel();
}

std::vector<std::shared_ptr<Operation>> OperationQueue::operations() const {
  std::lock_guard lock(mutex_);
  std::vector<std::shared_ptr<Operation>> all(running_.begin(), running_.end());
  all.insert(all.end(), waiting_.begin(), waiting_.end());
  return all;
}

std::size_t OperationQueue::operationCount() const {
  std::lock_guard lock(mutex_);
  return running_.size() + waiting_.size();
}

void OperationQueue::waitUntilAllOperationsAreFinished() const {
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [this] { return waiting_.empty() && running_.empty(); });
}

void OperationQueue::startWorkersIfNeeded() {
  // One worker per operation that may run now; workers stay for later operations.
  std::size_t limit = maxConcurrent_ < 1 ? waiting_.size() + running_.size()
                                         : static_cast<std::size_t>(maxConcurrent_);
  std::size_t wanted = std::min(limit, waiting_.size() + running_.size());
  while (workers_.size() < wanted && idleWorkers_ < waiting_.size()) {
    workers_.emplace_back([this] { workerLoop(); });
    ++idleWorkers_;
  }
}

void OperationQueue::workerLoop() {
  std::unique_lock lock(mutex_);
  for (;;) {
    changed_.wait(lock, [this] {
      bool room = maxConcurrent_ < 1 || running_.size() < static_cast<std::size_t>(maxConcurrent_);
      return stopping_ || (room && !waiting_.empty());
    });
    if (stopping_) return;
    std::shared_ptr<Operation> operation = std::move(waiting_.front());
    waiting_.pop_front();
    running_.push_back(operation);
    --idleWorkers_;
    lock.unlock();
    operation->start();
    lock.lock();
    running_.erase(std::find(running_.begin(), running_.end(), operation));
    ++idleWorkers_;
    lock.unlock();
    operation.reset();  // release what the work captured outside the queue's lock
    lock.lock();
    changed_.notify_all();
  }
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
