#include "platform/run_loop.h"

#include <algorithm>

namespace cloudreel {

RunLoop& RunLoop::main() {
  static RunLoop loop;
  return loop;
}

void RunLoop::post(Task task) {
  {
    std::lock_guard lock(mutex_);
    tasks_.push_back(std::move(task));
  }
  wake_.notify_all();
  if (wakeHandler_) {
    wakeHandler_();
  }
}

RunLoop::TimerId RunLoop::scheduleTimer(Clock::duration interval, bool repeats, Task task) {
  TimerId id;
  {
    std::lock_guard lock(mutex_);
    id = nextTimer_++;
    timers_.emplace(id, Timer{Clock::now() + interval, interval, repeats, std::move(task)});
  }
  wake_.notify_all();
  if (wakeHandler_) {
    wakeHandler_();
  }
  return id;
}

void RunLoop::setWakeHandler(std::function<void()> handler) { wakeHandler_ = std::move(handler); }

std::optional<RunLoop::Clock::duration> RunLoop::timeUntilNextTimer() const {
  std::lock_guard lock(mutex_);
  if (timers_.empty()) {
    return std::nullopt;
  }
  auto due = Clock::time_point::max();
  for (const auto& [id, timer] : timers_) {
    due = std::min(due, timer.due);
  }
  return std::max(Clock::duration::zero(), due - Clock::now());
}

void RunLoop::invalidateTimer(TimerId id) {
  std::lock_guard lock(mutex_);
  timers_.erase(id);
}

bool RunLoop::isTimerValid(TimerId id) const {
  std::lock_guard lock(mutex_);
  return timers_.contains(id);
}

bool RunLoop::runOne() {
  Task task;
  {
    std::lock_guard lock(mutex_);
    if (!tasks_.empty()) {
      task = std::move(tasks_.front());
      tasks_.pop_front();
    } else {
      const auto now = Clock::now();
      for (auto& [id, timer] : timers_) {
        if (timer.due <= now) {
          task = timer.task;
          if (timer.repeats) {
            timer.due = now + timer.interval;
          } else {
            timers_.erase(id);
          }
          break;
        }
      }
    }
  }
  if (!task) {
    return false;
  }
  task();
  return true;
}

bool RunLoop::runPending() {
  bool ran = false;
  // Only what is ready now: tasks posted by these tasks wait for the next
  // pass, so a task that re-posts itself cannot starve the caller.
  std::size_t budget;
  {
    std::lock_guard lock(mutex_);
    budget = tasks_.size() + timers_.size();
  }
  while (budget-- > 0 && runOne()) {
    ran = true;
  }
  return ran;
}

bool RunLoop::runUntil(Clock::time_point deadline) {
  bool stopped = false;
  (void)runUntilStopped([] { return false; }, deadline, &stopped);
  return stopped;
}

bool RunLoop::runUntil(const std::function<bool()>& condition, Clock::duration timeout) {
  return runUntilStopped(condition, Clock::now() + timeout, nullptr);
}

bool RunLoop::runUntilStopped(const std::function<bool()>& condition, Clock::time_point deadline,
                              bool* stopped) {
  // A stop requested before this run began is honoured, not cleared: the
  // thread that asked cannot know whether the run had started yet. Each
  // stop ends exactly one run.
  auto takeStop = [this, stopped] {
    std::lock_guard lock(mutex_);
    if (!stopRequested_) {
      return false;
    }
    stopRequested_ = false;
    if (stopped != nullptr) {
      *stopped = true;
    }
    return true;
  };
  while (true) {
    if (condition()) {
      return true;
    }
    if (takeStop()) {
      return condition();
    }
    // The deadline holds even while tasks keep coming.
    if (Clock::now() >= deadline) {
      return condition();
    }
    if (runOne()) {
      continue;
    }
    std::unique_lock lock(mutex_);
    if (stopRequested_) {
      continue;
    }
    auto wakeAt = deadline;
    for (const auto& [id, timer] : timers_) {
      wakeAt = std::min(wakeAt, timer.due);
    }
    if (Clock::now() >= deadline) {
      return condition();
    }
    wake_.wait_until(lock, wakeAt, [this] { return !tasks_.empty() || stopRequested_; });
  }
}

void RunLoop::stop() {
  {
    std::lock_guard lock(mutex_);
    stopRequested_ = true;
  }
  wake_.notify_all();
}

BackgroundQueue::BackgroundQueue()
    : thread_([this](const std::stop_token& stop) { loop(stop); }) {}

BackgroundQueue::~BackgroundQueue() {
  thread_.request_stop();
  wake_.notify_all();
  // The jthread joins here, after the queue has drained.
}

void BackgroundQueue::async(std::function<void()> work) {
  {
    std::lock_guard lock(mutex_);
    work_.push_back(std::move(work));
  }
  wake_.notify_all();
}

void BackgroundQueue::async(std::function<void()> work, RunLoop& completionLoop,
                            std::function<void()> completion) {
  async([work = std::move(work), &completionLoop, completion = std::move(completion)]() mutable {
    work();
    completionLoop.post(std::move(completion));
  });
}

void BackgroundQueue::loop(const std::stop_token& stop) {
  while (true) {
    std::function<void()> next;
    {
      std::unique_lock lock(mutex_);
      wake_.wait(lock, stop, [this] { return !work_.empty(); });
      if (work_.empty()) {
        return;  // stop requested and nothing left to do
      }
      next = std::move(work_.front());
      work_.pop_front();
    }
    next();
  }
}

}  // namespace cloudreel
