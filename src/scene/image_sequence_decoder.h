#pragma once
// Decodes a card's frames ahead of playback on worker threads, so the
// thread that draws never decodes and never waits on a decode.
//
// What is held is a window: the frame asked for last (the playhead) and the
// budget-1 frames after it are decoded and kept; frames outside the window
// stay only while there is room, those behind the playhead going first
// (farthest first), then those beyond the window (farthest first). So at
// most `budget` pictures are held, whatever the caller asks.

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "scene/image_sequence.h"

namespace cloudreel {

class ImageSequenceDecoder {
 public:
  enum class State { Pending, Ready, Failed };
  struct Frame {
    State state = State::Pending;
    std::shared_ptr<const DecodedImage> image;  // when Ready
    std::string error;                          // when Failed: names the file and why
  };

  // budget >= 2 (smaller values are taken as 2); workers: min(2, hardware
  // cores), at least 1.
  explicit ImageSequenceDecoder(ImageSequence sequence, int budget = 6);
  // Stops the workers and joins them; queued work is dropped, and a decode
  // under way is finished and thrown away, so this waits for at most one
  // decode. A frame-done handler call already under way is waited for; none
  // starts after the destructor has begun stopping the workers.
  ~ImageSequenceDecoder();
  ImageSequenceDecoder(const ImageSequenceDecoder&) = delete;
  ImageSequenceDecoder& operator=(const ImageSequenceDecoder&) = delete;

  const ImageSequence& sequence() const { return sequence_; }
  int budget() const { return budget_; }

  // Never blocks on a decode: answers the frame's state now and queues it
  // (and the next budget-1 frames) for decoding if they are not held yet.
  // An index outside the sequence is clamped into it, as fileForFrame does.
  // A frame that failed is answered Failed again, without re-reading its
  // file, until it is dropped from what is held; asked for after that, it
  // is tried again.
  Frame request(int index);
  // Blocks until the frame is Ready or Failed (for off-screen renders, which
  // must show exactly the frame of their time), also queueing the ones
  // after it.
  Frame waitFor(int index);
  // Called on a worker thread, without the decoder's lock held, each time a
  // frame has been decoded or has failed and is held (the layer uses it to
  // ask its views to redraw). It must not wait for the thread that destroys
  // the decoder. Set it before the first request.
  void setFrameDoneHandler(std::function<void(int index)> handler);

  // How many decoded pictures are held now (failed frames hold none), and
  // the bytes of their pixels.
  int framesHeld() const;
  std::size_t bytesHeld() const;

 private:
  struct Held {
    State state = State::Failed;
    std::shared_ptr<const DecodedImage> image;
    std::string error;
  };
  using Dropped = std::vector<std::shared_ptr<const DecodedImage>>;

  void work();
  // The rest take the lock's holder's word that mutex_ is locked.
  int clampedLocked(int index) const;
  int windowEndLocked() const;
  // Makes `index` the playhead and queues the window's missing frames.
  void moveWindowLocked(int index);
  // Drops what is held beyond the budget, handing the pictures to `dropped`
  // so their memory is freed after the lock is released.
  void trimLocked(Dropped& dropped);
  Frame frameLocked(int index) const;
  Frame noFrames() const;

  const ImageSequence sequence_;
  const int budget_;

  mutable std::mutex mutex_;
  std::condition_variable workQueued_;
  std::condition_variable frameDone_;
  std::deque<int> queue_;
  std::set<int> inFlight_;
  std::map<int, Held> held_;
  int readyCount_ = 0;
  std::size_t bytesHeld_ = 0;
  int playhead_ = 0;
  bool stopping_ = false;
  std::function<void(int)> frameDoneHandler_;
  // Last, so the workers start after everything they use exists.
  std::vector<std::thread> workers_;
};

}  // namespace cloudreel
