// The operation queues and the main queue beneath the recognition jobs, where the jobs do
// not already drive them: running once, teardown with work waiting, draining.
#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>
#include <vector>

#include "Corvelbase/platform/OperationQueue.h"

namespace corvel {
namespace {

using namespace std::chrono_literals;

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
      while (!watch.expired() && std::chrono::steady_clock::now() < deadline)
        std::this_thread::yield();
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
  MainQueue::async(nullptr);  // nothing to run
  EXPECT_EQ(MainQueue::drain(), 0u);
  // The page tests wait with runUntil for their deliveries; here it gives up at its timeout.
  EXPECT_FALSE(MainQueue::runUntil([] { return false; }, 1ms));
}

}  // namespace
}  // namespace corvel
