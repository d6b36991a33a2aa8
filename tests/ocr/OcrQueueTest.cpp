// Operation queues and the main queue: limits, order, cancelling, delivery.
#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <thread>

#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "support/ManualDispatcher.h"

namespace corvel {
namespace {

using namespace std::chrono_literals;

// Lets operations in one at a time or all at once, and counts how many are inside.
class Turnstile {
 public:
  void enter() {
    std::unique_lock lock(mutex_);
    ++inside_;
    maxInside_ = std::max(maxInside_, inside_);
    changed_.notify_all();
    changed_.wait(lock, [this] { return open_; });
    --inside_;
  }
  bool waitForInside(int count, std::chrono::milliseconds timeout = 10s) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, timeout, [&] { return inside_ >= count; });
  }
  void open() {
    std::lock_guard lock(mutex_);
    open_ = true;
    changed_.notify_all();
  }
  int maxInside() {
    std::lock_guard lock(mutex_);
    return maxInside_;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  int inside_ = 0;
  int maxInside_ = 0;
  bool open_ = false;
};

TEST(OperationQueue, NeverRunsMoreThanItsMaximumAtOnce) {
  for (std::int64_t limit : {1, 2, 6}) {
    auto queue = OperationQueue::init();
    queue->setMaxConcurrentOperationCount(limit);
    Turnstile turnstile;
    std::atomic<int> ran{0};
    for (int i = 0; i < 10; ++i) {
      queue->addOperationWithBlock([&] {
        turnstile.enter();
        ++ran;
      });
    }
    ASSERT_TRUE(turnstile.waitForInside(static_cast<int>(limit)));
    // Give an over-eager queue the chance to start one more before letting them go.
    EXPECT_FALSE(turnstile.waitForInside(static_cast<int>(limit) + 1, 100ms)) << limit;
    turnstile.open();
    queue->waitUntilAllOperationsAreFinished();
    EXPECT_EQ(ran, 10);
    EXPECT_EQ(turnstile.maxInside(), limit);
    EXPECT_EQ(queue->operationCount(), 0u);
  }
}

TEST(OperationQueue, OneAtATimeRunsInTheOrderAdded) {
  auto queue = OperationQueue::init();
  queue->setMaxConcurrentOperationCount(1);
  std::vector<int> order;
  for (int i = 0; i < 20; ++i) queue->addOperationWithBlock([&order, i] { order.push_back(i); });
  queue->waitUntilAllOperationsAreFinished();
  ASSERT_EQ(order.size(), 20u);
  for (int i = 0; i < 20; ++i) EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
}

TEST(OperationQueue, CancelBeforeStartSkipsTheWorkAndCancelLaterChangesNothing) {
  auto queue = OperationQueue::init();
  queue->setMaxConcurrentOperationCount(1);
  Turnstile turnstile;
  std::atomic<bool> firstDone{false}, secondRan{false};
  auto first = BlockOperation::blockOperationWithBlock([&] {
    turnstile.enter();
    firstDone = true;
  });
  auto second = BlockOperation::blockOperationWithBlock([&] { secondRan = true; });
  queue->addOperation(first);
  queue->addOperation(second);
  ASSERT_TRUE(turnstile.waitForInside(1));
  EXPECT_TRUE(first->isExecuting());
  first->cancel();   // running: still completes its work
  second->cancel();  // waiting: never runs
  turnstile.open();
  second->waitUntilFinished();
  first->waitUntilFinished();
  EXPECT_TRUE(firstDone);
  EXPECT_FALSE(secondRan);
  EXPECT_TRUE(second->isFinished());
  EXPECT_TRUE(second->isCancelled());
  // Cancelling a finished operation leaves it as it was.
  auto third = BlockOperation::blockOperationWithBlock([] {});
  queue->addOperation(third);
  third->waitUntilFinished();
  third->cancel();
  EXPECT_FALSE(third->isCancelled());
}

TEST(OperationQueue, CancelAllSkipsEverythingWaiting) {
  auto queue = OperationQueue::init();
  queue->setMaxConcurrentOperationCount(1);
  Turnstile turnstile;
  std::atomic<int> ran{0};
  queue->addOperationWithBlock([&] { turnstile.enter(); });
  for (int i = 0; i < 5; ++i) queue->addOperationWithBlock([&] { ++ran; });
  ASSERT_TRUE(turnstile.waitForInside(1));
  EXPECT_EQ(queue->operationCount(), 6u);
  queue->cancelAllOperations();
  turnstile.open();
  queue->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(ran, 0);
}

TEST(OperationQueue, AddingTheSameOperationTwiceRunsItOnce) {
  auto queue = OperationQueue::init();
  std::atomic<int> ran{0};
  auto operation = BlockOperation::blockOperationWithBlock([&] { ++ran; });
  queue->addOperation(operation);
  queue->addOperation(operation);
  queue->addOperation(nullptr);
  queue->waitUntilAllOperationsAreFinished();
  queue->addOperation(operation);  // finished: ignored
  queue->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(ran, 1);
}

// Regression: a queue that goes away with work still waiting must not run it nor hang.
TEST(OperationQueue, DestroyingAQueueDropsWaitingWorkAndReleasesIt) {
  auto held = std::make_shared<int>(7);
  std::weak_ptr<int> watch = held;
  std::atomic<bool> ran{false};
  {
    auto queue = OperationQueue::init();
    queue->setMaxConcurrentOperationCount(1);
    Turnstile turnstile;
    queue->addOperationWithBlock([&] { turnstile.enter(); });
    queue->addOperationWithBlock([&ran, held] { ran = true; });
    held.reset();
    ASSERT_TRUE(turnstile.waitForInside(1));
    std::thread opener([&] { turnstile.open(); });
    queue.reset();
    opener.join();
  }
  EXPECT_FALSE(ran);
  EXPECT_TRUE(watch.expired());
}

TEST(MainQueue, WorkWaitsForTheDrainAndRunsInOrder) {
  MainQueue::drain();  // whatever earlier tests left
  std::vector<int> order;
  std::thread worker([&] {
    for (int i = 0; i < 3; ++i) MainQueue::async([&order, i] { order.push_back(i); });
  });
  worker.join();
  EXPECT_TRUE(order.empty());
  EXPECT_EQ(MainQueue::drain(), 3u);
  EXPECT_EQ(order, (std::vector<int>{0, 1, 2}));
  EXPECT_EQ(MainQueue::drain(), 0u);
}

TEST(MainQueue, RunUntilReturnsWhenDoneOrAtItsTimeout) {
  bool done = false;
  std::thread worker([&] { MainQueue::async([&] { done = true; }); });
  EXPECT_TRUE(MainQueue::runUntil([&] { return done; }, 10s));
  worker.join();
  EXPECT_FALSE(MainQueue::runUntil([] { return false; }, 30ms));
}

TEST(MainQueue, AnInstalledDispatcherReceivesTheWork) {
  auto manual = std::make_shared<testing::ManualDispatcher>();
  PlatformRegistry::setMainQueueDispatcher(manual);
  int ran = 0;
  MainQueue::async([&] { ++ran; });
  MainQueue::async(nullptr);          // nothing to dispatch
  EXPECT_EQ(MainQueue::drain(), 0u);  // not the internal queue's
  EXPECT_EQ(manual->pending(), 1u);
  EXPECT_EQ(manual->drain(), 1u);
  EXPECT_EQ(ran, 1);
  PlatformRegistry::setMainQueueDispatcher(nullptr);
  MainQueue::async([&] { ++ran; });
  EXPECT_EQ(MainQueue::drain(), 1u);
  EXPECT_EQ(ran, 2);
}

}  // namespace
}  // namespace corvel
