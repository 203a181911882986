#include "scene/image_sequence_decoder.h"

#include <algorithm>
#include <cstdint>
#include <utility>

namespace cloudreel {

namespace {

int workerCount() {
  const unsigned cores = std::thread::hardware_concurrency();
  // hardware_concurrency answers 0 when it cannot tell.
  return cores >= 2 ? 2 : 1;
}

}  // namespace

ImageSequenceDecoder::ImageSequenceDecoder(ImageSequence sequence, int budget)
    : sequence_(std::move(sequence)), budget_(std::max(2, budget)) {
  const int workers = workerCount();
  workers_.reserve(static_cast<std::size_t>(workers));
  for (int i = 0; i < workers; ++i) {
    workers_.emplace_back([this] { work(); });
  }
}

ImageSequenceDecoder::~ImageSequenceDecoder() {
  {
    std::lock_guard lock(mutex_);
    stopping_ = true;
    queue_.clear();
  }
  workQueued_.notify_all();
  frameDone_.notify_all();
  for (std::thread& worker : workers_) {
    worker.join();
  }
}

void ImageSequenceDecoder::setFrameDoneHandler(std::function<void(int index)> handler) {
  std::lock_guard lock(mutex_);
  frameDoneHandler_ = std::move(handler);
}

ImageSequenceDecoder::Frame ImageSequenceDecoder::request(int index) {
  if (sequence_.frameCount() <= 0) {
    return noFrames();
  }
  std::lock_guard lock(mutex_);
  const int frame = clampedLocked(index);
  moveWindowLocked(frame);
  return frameLocked(frame);
}

ImageSequenceDecoder::Frame ImageSequenceDecoder::waitFor(int index) {
  if (sequence_.frameCount() <= 0) {
    return noFrames();
  }
  std::unique_lock lock(mutex_);
  const int frame = clampedLocked(index);
  moveWindowLocked(frame);
  // The frame is in the window, and only this caller moves the window, so
  // once it is held it stays held until this returns.
  frameDone_.wait(lock, [&] { return stopping_ || held_.contains(frame); });
  return frameLocked(frame);
}

int ImageSequenceDecoder::framesHeld() const {
  std::lock_guard lock(mutex_);
  return readyCount_;
}

std::size_t ImageSequenceDecoder::bytesHeld() const {
  std::lock_guard lock(mutex_);
  return bytesHeld_;
}

void ImageSequenceDecoder::work() {
  std::unique_lock lock(mutex_);
  while (true) {
    workQueued_.wait(lock, [&] { return stopping_ || !queue_.empty(); });
    if (stopping_) {
      return;
    }
    const int index = queue_.front();
    queue_.pop_front();
    inFlight_.insert(index);
    const std::filesystem::path file = sequence_.fileForFrame(index);
    lock.unlock();

    // The decode, the only slow part, runs without the lock.
    Error error;
    std::optional<DecodedImage> image = decodeImageFile(file, &error);
    Held held;
    if (image) {
      held.state = State::Ready;
      held.image = std::make_shared<const DecodedImage>(std::move(*image));
    } else {
      held.error = error.message;
    }

    Dropped dropped;
    lock.lock();
    inFlight_.erase(index);
    if (stopping_) {
      return;
    }
    // A frame the playhead has left behind meanwhile is not kept: the
    // window's frames need the room.
    const bool kept = index >= playhead_ && index <= windowEndLocked();
    if (kept) {
      if (held.image) {
        ++readyCount_;
        bytesHeld_ += held.image->byteCount();
      }
      held_[index] = std::move(held);
      trimLocked(dropped);
    }
    std::function<void(int)> handler = kept ? frameDoneHandler_ : nullptr;
    lock.unlock();
    frameDone_.notify_all();
    // Pictures go and the handler runs outside the lock, so the drawing
    // thread never waits on either.
    dropped.clear();
    held.image.reset();
    if (handler) {
      handler(index);
    }
    lock.lock();
  }
}

int ImageSequenceDecoder::clampedLocked(int index) const {
  return std::clamp(index, 0, sequence_.frameCount() - 1);
}

int ImageSequenceDecoder::windowEndLocked() const {
  // In 64 bits: the playhead plus the budget may pass INT_MAX.
  const std::int64_t end = std::int64_t{playhead_} + budget_ - 1;
  return static_cast<int>(std::min<std::int64_t>(end, sequence_.frameCount() - 1));
}

void ImageSequenceDecoder::moveWindowLocked(int index) {
  playhead_ = index;
  // Queued frames of an earlier window are no longer wanted; the queue is
  // rebuilt in playback order so the frame asked for is decoded first.
  queue_.clear();
  const int end = windowEndLocked();
  for (int frame = index; frame <= end; ++frame) {
    if (!held_.contains(frame) && !inFlight_.contains(frame)) {
      queue_.push_back(frame);
    }
  }
  if (!queue_.empty()) {
    workQueued_.notify_all();
  }
}

void ImageSequenceDecoder::trimLocked(Dropped& dropped) {
  const int end = windowEndLocked();
  while (held_.size() > static_cast<std::size_t>(budget_)) {
    // Behind the playhead, the farthest first; then beyond the window, the
    // farthest first. The window itself never holds more than the budget.
    auto victim = held_.begin();
    if (victim->first >= playhead_) {
      victim = std::prev(held_.end());
      if (victim->first <= end) {
        break;
      }
    }
    if (victim->second.image) {
      --readyCount_;
      bytesHeld_ -= victim->second.image->byteCount();
      dropped.push_back(std::move(victim->second.image));
    }
    held_.erase(victim);
  }
}

ImageSequenceDecoder::Frame ImageSequenceDecoder::frameLocked(int index) const {
  const auto found = held_.find(index);
  if (found == held_.end()) {
    return {};
  }
  return Frame{found->second.state, found->second.image, found->second.error};
}

ImageSequenceDecoder::Frame ImageSequenceDecoder::noFrames() const {
  return Frame{State::Failed, nullptr,
               "The picture sequence “" + sequence_.source() + "” has no frames."};
}

}  // namespace cloudreel
