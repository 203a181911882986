#include "platform/run_loop.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

namespace cloudreel {
namespace {

using namespace std::chrono_literals;

TEST(RunLoop, RunsPostedTasksInOrderOnItsOwnThread) {
  RunLoop loop;
  std::vector<int> order;
  const auto loopThread = std::this_thread::get_id();
  std::thread poster([&] {
    for (int i = 0; i < 3; ++i) {
      loop.post([&, i] {
        EXPECT_EQ(std::this_thread::get_id(), loopThread);
        order.push_back(i);
      });
    }
  });
  poster.join();
  EXPECT_TRUE(loop.runUntil([&] { return order.size() == 3; }, 5s));
  EXPECT_EQ(order, std::vector<int>({0, 1, 2}));
}

TEST(RunLoop, RepeatingTimerFiresUntilInvalidatedFromItsOwnTask) {
  RunLoop loop;
  int fired = 0;
  RunLoop::TimerId id = 0;
  id = loop.scheduleTimer(1ms, true, [&] {
    if (++fired == 3) {
      loop.invalidateTimer(id);
    }
  });
  EXPECT_TRUE(loop.runUntil([&] { return !loop.isTimerValid(id); }, 5s));
  EXPECT_EQ(fired, 3);
  loop.invalidateTimer(id);  // already gone: harmless
  int once = 0;
  const auto single = loop.scheduleTimer(0ms, false, [&] { ++once; });
  EXPECT_TRUE(loop.runUntil([&] { return once == 1; }, 5s));
  EXPECT_FALSE(loop.isTimerValid(single));
}

// A front end's own event loop is woken by posts from any thread and by
// new timers, and learns when the next timer is due.
TEST(RunLoop, WakesAFrontEndOnPostsAndTimersAndTellsWhenTheNextTimerIsDue) {
  RunLoop loop;
  std::atomic<int> wakes = 0;
  loop.setWakeHandler([&] { ++wakes; });
  EXPECT_FALSE(loop.timeUntilNextTimer().has_value());
  std::thread poster([&] { loop.post([] {}); });
  poster.join();
  EXPECT_EQ(wakes, 1);
  const auto far = loop.scheduleTimer(1h, false, [] {});
  EXPECT_EQ(wakes, 2);
  ASSERT_TRUE(loop.timeUntilNextTimer().has_value());
  EXPECT_GT(*loop.timeUntilNextTimer(), 59min);
  const auto overdue = loop.scheduleTimer(-1s, false, [] {});
  EXPECT_EQ(loop.timeUntilNextTimer(), RunLoop::Clock::duration::zero());
  EXPECT_TRUE(loop.runPending());
  EXPECT_FALSE(loop.isTimerValid(overdue));
  EXPECT_TRUE(loop.isTimerValid(far));
}

// A lost stop leaves the run to its deadline, which answers NO: the checks
// fail on the outcome, not on how long the run took.
TEST(RunLoop, StopEndsARunWhetherItArrivesBeforeOrDuringTheRun) {
  RunLoop loop;
  loop.stop();  // before the run starts
  EXPECT_TRUE(loop.runUntil(RunLoop::Clock::now() + 30s));
  for (int i = 0; i < 20; ++i) {
    std::thread stopper([&] { loop.stop(); });
    EXPECT_TRUE(loop.runUntil(RunLoop::Clock::now() + 30s));
    stopper.join();
  }
  // One stop ends one run; a busy loop stops after the current task.
  int ran = 0;
  std::function<void()> busy = [&] {
    if (++ran == 3) {
      loop.stop();
    }
    loop.post(busy);
  };
  loop.post(busy);
  EXPECT_TRUE(loop.runUntil(RunLoop::Clock::now() + 30s));
  EXPECT_EQ(ran, 3);
  EXPECT_FALSE(loop.runUntil(RunLoop::Clock::now() + 1ms));
}

TEST(BackgroundQueue, RunsWorkOffTheMainThreadAndPostsCompletionBack) {
  RunLoop loop;
  const auto mainThread = std::this_thread::get_id();
  std::thread::id workThread;
  bool completed = false;
  std::atomic<int> later{0};
  {
    BackgroundQueue queue;
    queue.async([&] { workThread = std::this_thread::get_id(); }, loop, [&] {
      EXPECT_EQ(std::this_thread::get_id(), mainThread);
      completed = true;
    });
    EXPECT_TRUE(loop.runUntil([&] { return completed; }, 5s));
    for (int i = 0; i < 10; ++i) {
      queue.async([&] { ++later; });
    }
  }  // destruction finishes the queued work
  EXPECT_NE(workThread, mainThread);
  EXPECT_EQ(later, 10);
}

}  // namespace
}  // namespace cloudreel
