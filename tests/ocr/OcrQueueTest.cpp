// Operation queues and the main queue: limits, order, cancelling, delivery. The recognition
// jobs' tests drive the shared queue's limit and cancelling; these cover the rest.
#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>

#include "Corvelbase/platform/OperationQueue.h"
#include "Corvelbase/platform/Platform.h"
#include "support/ManualDispatcher.h"

namespace corvel {
namespace {

using namespace std::chrono_literals;

TEST(OperationQueue, OneAtATimeRunsInTheOrderAddedWithoutOverlap) {
  auto queue = OperationQueue::init();
  queue->setMaxConcurrentOperationCount(1);
  std::vector<int> order;
  std::atomic<int> inside{0}, overlaps{0};
  for (int i = 0; i < 20; ++i) {
    queue->addOperationWithBlock([&, i] {
      if (++inside > 1) ++overlaps;
      std::this_thread::yield();
      order.push_back(i);
      --inside;
    });
  }
  queue->waitUntilAllOperationsAreFinished();
  EXPECT_EQ(overlaps, 0);
  ASSERT_EQ(order.size(), 20u);
  for (int i = 0; i < 20; ++i) EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
  EXPECT_EQ(queue->operationCount(), 0u);
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
  std::promise<void> started, open;
  {
    auto queue = OperationQueue::init();
    queue->setMaxConcurrentOperationCount(1);
    queue->addOperationWithBlock([&] {
      started.set_value();
      open.get_future().wait();
    });
    queue->addOperationWithBlock([&ran, held] { ran = true; });
    held.reset();
    ASSERT_EQ(started.get_future().wait_for(10s), std::future_status::ready);
    // The running work may finish only once the waiting work has been dropped (its block,
    // holding the last reference, is gone): otherwise the worker could start it first.
    std::thread opener([&] {
      auto deadline = std::chrono::steady_clock::now() + 10s;
      while (!watch.expired() && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::yield();
      }
      open.set_value();
    });
    queue.reset();
    opener.join();
  }
  EXPECT_FALSE(ran);
  EXPECT_TRUE(watch.expired());
}

TEST(MainQueue, WorkWaitsForTheDrainOrRunUntilAndRunsInOrder) {
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
  // runUntil returns once the condition holds, or false at its timeout.
  bool done = false;
  std::thread later([&] { MainQueue::async([&] { done = true; }); });
  EXPECT_TRUE(MainQueue::runUntil([&] { return done; }, 10s));
  later.join();
  EXPECT_FALSE(MainQueue::runUntil([] { return false; }, 30ms));
}

TEST(MainQueue, AnInstalledDispatcherReceivesTheWork) {
  auto manual = std::make_shared<testing::ManualDispatcher>();
  PlatformRegistry::setMainQueueDispatcher(manual);
  int ran = 0;
  MainQueue::async([&] { ++ran; });
  MainQueue::async(nullptr);          // nothing to dispatch
  EXPECT_EQ(MainQueue::drain(), 0u);  // not the internal queue's
  EXPECT_EQ(manual->drain(), 1u);
  EXPECT_EQ(ran, 1);
  PlatformRegistry::setMainQueueDispatcher(nullptr);
  MainQueue::async([&] { ++ran; });
  EXPECT_EQ(MainQueue::drain(), 1u);
  EXPECT_EQ(ran, 2);
}

}  // namespace
}  // namespace corvel
