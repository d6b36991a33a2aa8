// Operation queues, block operations and the main queue.
//
// An `OperationQueue` runs its operations on worker threads of its own, at most
// `maxConcurrentOperationCount` at once, in the order they were added. An operation
// cancelled before a worker takes it never runs: it is marked finished without running.
// Cancelling an operation that is running or finished changes nothing about its work
// (the work may look at `isCancelled` itself; block operations of this library never do).
//
// The `MainQueue` is where work for the host's main thread goes. A host with a main loop
// installs a `MainQueueDispatcher` that posts into it (PlatformRegistry); without one,
// work waits in an internal queue until the host (or the `corvel` program) drains it
// with `MainQueue::drain` or `MainQueue::runUntil`.
//
// Every member of these classes is safe to call from any thread.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <vector>

#include "Corvelbase/Export.h"

namespace corvel {

// A unit of work. Subclasses say what `main` does; the queue calls it at most once.
class CORVEL_EXPORT Operation : public std::enable_shared_from_this<Operation> {
 public:
  virtual ~Operation();
  Operation(const Operation&) = delete;
  Operation& operator=(const Operation&) = delete;

  // Marks the operation cancelled. If it has not started, it never will: the queue then
  // finishes it without running it. Without effect on a running or finished operation.
  void cancel();
  bool isCancelled() const;
  bool isExecuting() const;
  bool isFinished() const;
  // Blocks until the operation has finished (ran, or was skipped after a cancel). Must
  // not be called from the operation's own work.
  void waitUntilFinished() const;

 protected:
  Operation() = default;
  virtual void main() = 0;
  // Called instead of `main` when the operation finishes without running (cancelled
  // before it started, or dropped by a queue that goes away): lets go of the work's
  // captures, which may hold the operation's owner.
  virtual void discard() {}

 private:
  friend class OperationQueue;
  // Runs `main` unless cancelled, then marks the operation finished.
  void start();
  // Marks a cancelled operation finished without running it.
  void finishUnrun();

  mutable std::mutex mutex_;
  mutable std::condition_variable finishedChanged_;
  bool cancelled_ = false;
  bool executing_ = false;
  bool finished_ = false;
};

// An operation that runs one block of work.
class CORVEL_EXPORT BlockOperation final : public Operation {
 public:
  static std::shared_ptr<BlockOperation> blockOperationWithBlock(std::function<void()> block);

 protected:
  void main() override;
  void discard() override { block_ = nullptr; }

 private:
  explicit BlockOperation(std::function<void()> block) : block_(std::move(block)) {}
  std::function<void()> block_;
};

class CORVEL_EXPORT OperationQueue {
 public:
  // A queue that runs any number of operations at once until a maximum is set.
  static std::shared_ptr<OperationQueue> init();
  // Waits for running operations; operations that have not started are dropped unrun.
  ~OperationQueue();
  OperationQueue(const OperationQueue&) = delete;
  OperationQueue& operator=(const OperationQueue&) = delete;

  // Values below 1 mean "no limit". Raising the limit starts waiting operations at once.
  void setMaxConcurrentOperationCount(std::int64_t count);
  std::int64_t maxConcurrentOperationCount() const;

  // Queues `operation` (ignored when null or already added to a queue).
  void addOperation(std::shared_ptr<Operation> operation);
  void addOperationWithBlock(std::function<void()> block);
  // Cancels every operation that is waiting or running (see Operation::cancel).
  void cancelAllOperations();
  // The operations that have not finished, in the order they were added.
  std::vector<std::shared_ptr<Operation>> operations() const;
  std::size_t operationCount() const;
  // Blocks until no operation is waiting or running. Not from a worker of this queue.
  void waitUntilAllOperationsAreFinished() const;

 private:
  struct Workers;  // the worker threads and the operations they share
  OperationQueue();
  const std::unique_ptr<Workers> workers_;
};

// Receives work for the main thread. A host implements it on its own main loop.
class CORVEL_EXPORT MainQueueDispatcher {
 public:
  virtual ~MainQueueDispatcher();
  // Arranges for `work` to run on the main thread, after any work dispatched before it.
  virtual void dispatch(std::function<void()> work) = 0;
};

class CORVEL_EXPORT MainQueue {
 public:
  // Hands `work` to the installed dispatcher, or to the internal queue when none is
  // installed.
  static void async(std::function<void()> work);
  // Runs the work waiting in the internal queue (including work queued while draining)
  // on the calling thread; returns how many blocks ran.
  static std::size_t drain();
  // Runs internal-queue work on the calling thread as it arrives until `done()` is true
  // (checked after each block and when the queue is empty) or `timeout` passes; true
  // when `done()` became true.
  static bool runUntil(const std::function<bool()>& done,
                       std::chrono::milliseconds timeout = std::chrono::hours(24 * 365));
};

}  // namespace corvel
