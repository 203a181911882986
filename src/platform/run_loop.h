#pragma once
// The core's event loop: work posted from any thread runs on the loop's
// thread in posting order, and timers fire there. The command line and the
// tests run it themselves; the Qt shell maps the same calls onto its own
// event loop.

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <thread>

namespace cloudreel {

class RunLoop {
 public:
  using Task = std::function<void()>;
  using Clock = std::chrono::steady_clock;
  using TimerId = std::uint64_t;

  RunLoop() = default;
  RunLoop(const RunLoop&) = delete;
  RunLoop& operator=(const RunLoop&) = delete;

  // The main thread's loop.
  static RunLoop& main();

  // Queues a task; safe from any thread.
  void post(Task task);

  // A timer firing every interval (or once), first after one interval. A
  // late timer fires once and is rescheduled from the time it fired, so a
  // busy loop never sees a burst of catch-up calls.
  TimerId scheduleTimer(Clock::duration interval, bool repeats, Task task);
  // Stops a timer; harmless for an unknown or already finished timer, and
  // allowed from inside the timer's own task.
  void invalidateTimer(TimerId id);
  bool isTimerValid(TimerId id) const;

  // Runs tasks and timers until stop() or the deadline; answers whether a
  // stop ended it.
  bool runUntil(Clock::time_point deadline);
  // Runs until the condition holds (checked after each task or timer) or the
  // timeout passes; answers whether the condition held.
  bool runUntil(const std::function<bool()>& condition, Clock::duration timeout);
  // Runs what is ready now without waiting; answers whether anything ran.
  bool runPending();
  // Makes a running loop return after its current task; safe from any
  // thread. A stop that arrives while no run is under way ends the next run
  // at its start, so a stop sent just before a run starts is never lost.
  void stop();

  // For a front end that drives the loop from an event loop of its own:
  // the handler is called, on the posting thread and outside the loop's
  // lock, whenever a task is posted or a timer scheduled, so it can arrange
  // a runPending on its own thread. Set it before other threads post.
  void setWakeHandler(std::function<void()> handler);
  // How long until the earliest timer is due (zero when one is late);
  // nothing when no timer is scheduled.
  std::optional<Clock::duration> timeUntilNextTimer() const;

 private:
  struct Timer {
    Clock::time_point due;
    Clock::duration interval;
    bool repeats;
    Task task;
  };
  // Runs one ready task or due timer; answers whether one ran.
  bool runOne();
  bool runUntilStopped(const std::function<bool()>& condition, Clock::time_point deadline,
                       bool* stopped);

  mutable std::mutex mutex_;
  std::condition_variable wake_;
  std::deque<Task> tasks_;
  std::map<TimerId, Timer> timers_;
  TimerId nextTimer_ = 1;
  bool stopRequested_ = false;
  std::function<void()> wakeHandler_;
};

// A serial background thread: work runs in the order given, one item at a
// time, off the main thread. Destruction finishes the queued work and joins.
class BackgroundQueue {
 public:
  BackgroundQueue();
  ~BackgroundQueue();
  BackgroundQueue(const BackgroundQueue&) = delete;
  BackgroundQueue& operator=(const BackgroundQueue&) = delete;

  void async(std::function<void()> work);
  // Runs work in the background, then its completion on the given loop.
  void async(std::function<void()> work, RunLoop& completionLoop, std::function<void()> completion);

 private:
  void loop(const std::stop_token& stop);

  std::mutex mutex_;
  std::condition_variable_any wake_;
  std::deque<std::function<void()>> work_;
  std::jthread thread_;
};

}  // namespace cloudreel
