#include "import/bundle_points.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <condition_variable>
#include <cstring>
#include <functional>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

#include "import/text_scanner.h"
#include "platform/byte_stream.h"

namespace cloudreel {

namespace {

// More threads than this gain nothing on a block of a few megabytes.
constexpr unsigned kMostThreads = 64;
// The block a thread parses, unless the reading asks for another size,
// and the most text held however many threads there are.
constexpr std::size_t kBlockBytesPerThread = std::size_t{128} << 10;
constexpr std::size_t kMostBlockBytes = std::size_t{2} << 20;
// A larger block would only hold more of the file in memory.
constexpr std::size_t kLargestBlock = std::size_t{1} << 30;

struct ParsedPoint {
  std::array<float, 3> xyz{};
  std::array<std::int64_t, 3> rgb{};
};

void storePoint(std::uint8_t* record, std::size_t stride, const ParsedPoint& point,
                std::int32_t index) {
  std::memcpy(record, point.xyz.data(), sizeof point.xyz);
  // The low eight bits, unclamped: 300 is stored as 44, -1 as 255.
  for (std::size_t c = 0; c < 3; ++c) {
    record[stride - 4 + c] = static_cast<std::uint8_t>(point.rgb[c]);
  }
  record[stride - 1] = static_cast<std::uint8_t>(index);
}

// The layer's bounding box over a run of points: the first point sets all
// six values, and each later one lowers a minimum only when strictly
// smaller and raises a maximum only when strictly larger. So a NaN in the
// first point stays, a later NaN changes nothing, and of equal values
// (0 and -0) the first is kept. Runs read apart are joined in file order
// with `append`, which gives the box of one run over all their points: the
// first point's values are kept beside the extremes of the other values,
// which a NaN first value would otherwise hide.
class BoxFold {
 public:
  void add(const std::array<float, 3>& xyz) {
    for (std::size_t axis = 0; axis < 3; ++axis) {
      const double v = xyz[axis];
      if (empty_) {
        first_[axis] = v;
      }
      if (std::isnan(v)) {
        continue;
      }
      Axis& a = axes_[axis];
      if (!a.seen || v < a.low) {
        a.low = v;
      }
      if (!a.seen || v > a.high) {
        a.high = v;
      }
      a.seen = true;
    }
    empty_ = false;
  }

  void append(const BoxFold& later) {
    if (later.empty_) {
      return;
    }
    if (empty_) {
      *this = later;
      return;
    }
    for (std::size_t axis = 0; axis < 3; ++axis) {
      Axis& a = axes_[axis];
      const Axis& b = later.axes_[axis];
      if (!b.seen) {
        continue;
      }
      if (!a.seen || b.low < a.low) {
        a.low = b.low;
      }
      if (!a.seen || b.high > a.high) {
        a.high = b.high;
      }
      a.seen = true;
    }
  }

  std::optional<Layer::BoundingBox> box() const {
    if (empty_) {
      return std::nullopt;
    }
    Layer::BoundingBox box{};
    for (std::size_t axis = 0; axis < 3; ++axis) {
      // A first value that is not NaN is itself one of the values folded,
      // so the extremes hold it or what beat it.
      const bool nan = std::isnan(first_[axis]);
      box[axis] = nan ? first_[axis] : axes_[axis].low;
      box[axis + 3] = nan ? first_[axis] : axes_[axis].high;
    }
    return box;
  }

 private:
  struct Axis {
    bool seen = false;  // a value other than NaN was folded
    double low = 0.0;
    double high = 0.0;
  };
  bool empty_ = true;
  std::array<double, 3> first_{};
  std::array<Axis, 3> axes_{};
};

// --- the reading on one thread: the reference the parallel one equals

// Reads the point at the scanner's position, or answers NO when only white
// space is left.
bool scanPoint(TextScanner& scanner, ParsedPoint& point) {
  if (scanner.atEnd()) {
    return false;
  }
  point = {};
  for (float& v : point.xyz) {
    (void)scanner.scan(v);
  }
  for (std::int64_t& v : point.rgb) {
    (void)scanner.scan(v);
  }
  // The rest of the colour line, then the view list, each whole however
  // long: a point seen by many cameras has a long view list.
  (void)scanner.skipLine();
  (void)scanner.skipLine();
  return true;
}

BundlePoints scanPoints(InputStream& in, std::uint8_t* records, std::size_t stride,
                        std::int32_t capacity) {
  TextScanner scanner(in);
  BoxFold box;
  std::int32_t read = 0;
  ParsedPoint point;
  while (read < capacity && scanPoint(scanner, point)) {
    storePoint(records + static_cast<std::size_t>(read) * stride, stride, point, read);
    box.add(point.xyz);
    ++read;
  }
  return {read, box.box()};
}

// --- the same reading over text held in memory

constexpr std::array<bool, 256> kSpaces = [] {
  std::array<bool, 256> spaces{};
  for (int c = 0; c < 256; ++c) {
    spaces[static_cast<std::size_t>(c)] = TextScanner::isSpace(static_cast<char>(c));
  }
  return spaces;
}();

bool isSpace(char c) { return kSpaces[static_cast<unsigned char>(c)]; }

// Reads the field at `p` (not white space) into `value` as
// TextScanner::parseField reads it, and answers where the field ends; null
// when it runs to the end of text that may go on. A number that white
// space follows is the whole field, so its end is where the number's
// parsing stopped and its characters are looked at once; any other field
// is measured first and parsed as the scanner parses it. (Parsing the
// field alone gives the same value: it is the number's longest match.)
template <typename T>
const char* parseField(const char* p, const char* end, bool final, T& value) {
  const char* limit = p + std::min(static_cast<std::size_t>(end - p), TextScanner::kFieldLimit);
  T parsed{};
  const auto [stop, ec] = std::from_chars(*p == '+' ? p + 1 : p, limit, parsed);
  if (ec == std::errc() && stop < limit && isSpace(*stop)) {
    value = parsed;
    return stop;
  }
  const char* fieldEnd = p;
  while (fieldEnd < end && !isSpace(*fieldEnd)) ++fieldEnd;
  if (fieldEnd == end && !final) {
    return nullptr;
  }
  (void)TextScanner::parseField(p, static_cast<std::size_t>(fieldEnd - p), value);
  return fieldEnd;
}

enum class Outcome {
  Read,          // a point was read
  NoMoreText,    // only white space is left
  NeedMoreText,  // the point runs to the end of the text held, which goes on
};

// Reads the point at `cursor` from the text that ends at `end` (the end of
// the file when `final`) as scanPoint reads it, and moves the cursor past
// it. Where the text held ends before the point does, nothing is read and
// the cursor stays.
Outcome parsePoint(const char*& cursor, const char* end, bool final, ParsedPoint& point) {
  const char* p = cursor;
  while (p < end && isSpace(*p)) ++p;
  if (p == end) {
    return final ? Outcome::NoMoreText : Outcome::NeedMoreText;
  }
  point = {};
  for (std::size_t f = 0; f < 6; ++f) {
    while (p < end && isSpace(*p)) ++p;
    if (p == end) {
      if (!final) {
        return Outcome::NeedMoreText;
      }
      break;  // the fields the file lacks read 0
    }
    p = f < 3 ? parseField(p, end, final, point.xyz[f])
              : parseField(p, end, final, point.rgb[f - 3]);
    if (p == nullptr) {
      return Outcome::NeedMoreText;
    }
  }
  for (int line = 0; line < 2; ++line) {
    const void* newline = std::memchr(p, '\n', static_cast<std::size_t>(end - p));
    if (newline == nullptr) {
      if (!final) {
        return Outcome::NeedMoreText;
      }
      p = end;
      break;
    }
    p = static_cast<const char*>(newline) + 1;
  }
  cursor = p;
  return Outcome::Read;
}

// The line ends in [p, end).
std::size_t countNewlines(const char* p, const char* end) {
  constexpr std::uint64_t kLow7 = 0x7F7F7F7F7F7F7F7FULL;
  constexpr std::uint64_t kNewlines = 0x0A0A0A0A0A0A0A0AULL;
  constexpr std::uint64_t kOnes = 0x0101010101010101ULL;
  std::size_t count = 0;
  for (; end - p >= 8; p += 8) {
    std::uint64_t word;
    std::memcpy(&word, p, sizeof word);
    word ^= kNewlines;  // a newline is now a zero byte
    // The top bit of every zero byte and of no other: (b & 0x7F) + 0x7F
    // is at most 0xFE, so no carry crosses into the next byte. Those bits
    // moved down and summed by the multiplication into the top byte (at
    // most 8, so no carry is lost); a popcount instruction is not to be
    // had on every processor the build targets.
    const std::uint64_t zeros = ~(((word & kLow7) + kLow7) | word | kLow7) >> 7;
    count += static_cast<std::size_t>((zeros * kOnes) >> 56);
  }
  for (; p < end; ++p) {
    count += *p == '\n' ? 1 : 0;
  }
  return count;
}

// A stretch of a block that one thread reads: the points from `begin`,
// the first being point `firstIndex`, until a point would start at or past
// `cut` or `limit` points have been read. It may read on past `cut` to
// finish a point, up to `end`.
struct Part {
  const char* begin = nullptr;
  const char* cut = nullptr;
  std::int32_t firstIndex = 0;
  std::int32_t limit = 0;

  // Where the reading stopped (after its last point, or at the start of
  // one it could not read), how many it read and why it stopped.
  const char* stop = nullptr;
  std::int32_t count = 0;
  Outcome ending = Outcome::Read;
  BoxFold box;
};

void readPart(Part& part, const char* end, bool final, std::uint8_t* records, std::size_t stride) {
  const char* p = part.begin;
  std::int32_t index = part.firstIndex;
  ParsedPoint point;
  part.ending = Outcome::Read;
  while (p < part.cut && index < part.limit) {
    part.ending = parsePoint(p, end, final, point);
    if (part.ending != Outcome::Read) {
      break;
    }
    storePoint(records + static_cast<std::size_t>(index) * stride, stride, point, index);
    part.box.add(point.xyz);
    ++index;
  }
  part.stop = p;
  part.count = index - part.firstIndex;
}

// Threads that run one task together: the caller is worker 0, the others
// wait between tasks, so a block costs two wake-ups rather than two thread
// starts. Fewer threads than asked for run when the system refuses some.
class WorkerGroup {
 public:
  using Task = std::function<void(unsigned worker)>;

  explicit WorkerGroup(unsigned size) {
    threads_.reserve(size > 0 ? size - 1 : 0);
    for (unsigned w = 1; w < size; ++w) {
      try {
        threads_.emplace_back([this, w] { work(w); });
      } catch (const std::system_error&) {
        break;
      }
    }
  }
  ~WorkerGroup() {
    {
      const std::lock_guard lock(mutex_);
      stopping_ = true;
    }
    start_.notify_all();
    for (std::thread& thread : threads_) {
      thread.join();
    }
  }
  WorkerGroup(const WorkerGroup&) = delete;
  WorkerGroup& operator=(const WorkerGroup&) = delete;

  unsigned size() const { return static_cast<unsigned>(threads_.size()) + 1; }

  // Runs task(w) for the first `active` workers (all by default) and
  // returns when they have finished.
  void run(const Task& task, unsigned active = kMostThreads) {
    active = std::clamp(active, 1u, size());
    if (active > 1) {
      {
        const std::lock_guard lock(mutex_);
        task_ = &task;
        active_ = active;
        pending_ = active - 1;
        ++generation_;
      }
      start_.notify_all();
    }
    task(0);
    if (active == 1) {
      return;
    }
    std::unique_lock lock(mutex_);
    done_.wait(lock, [this] { return pending_ == 0; });
  }

 private:
  void work(unsigned worker) {
    std::uint64_t seen = 0;
    for (;;) {
      const Task* task = nullptr;
      {
        std::unique_lock lock(mutex_);
        start_.wait(lock, [&] { return stopping_ || generation_ != seen; });
        if (stopping_) {
          return;
        }
        seen = generation_;
        task = worker < active_ ? task_ : nullptr;
      }
      if (task == nullptr) {
        continue;
      }
      (*task)(worker);
      const std::lock_guard lock(mutex_);
      if (--pending_ == 0) {
        done_.notify_one();
      }
    }
  }

  std::mutex mutex_;
  std::condition_variable start_;
  std::condition_variable done_;
  const Task* task_ = nullptr;
  unsigned active_ = 0;
  std::size_t pending_ = 0;
  std::uint64_t generation_ = 0;
  bool stopping_ = false;
  std::vector<std::thread> threads_;
};

// The parallel reading: the text a block at a time, each block cut into
// one part per thread.
class BlockReader {
 public:
  BlockReader(InputStream& in, std::uint8_t* records, std::size_t stride, std::int32_t capacity,
              std::size_t blockBytes, unsigned threads)
      : in_(in),
        records_(records),
        stride_(stride),
        capacity_(capacity),
        block_(blockBytes),
        workers_(threads),
        newlines_(workers_.size()),
        parts_(workers_.size()),
        blockStart_(in.position()) {}

  BundlePoints read() {
    while (!finished_ && index_ < capacity_) {
      fill();
      if (at_ == held_ && final_) {
        break;
      }
      const std::size_t before = at_;
      readBlock();
      if (!finished_ && at_ == before) {
        // Not even one point fits in a block.
        readPointWithScanner();
      }
    }
    // Parts set aside may have written records past the count.
    if (written_ > index_) {
      std::memset(records_ + static_cast<std::size_t>(index_) * stride_, 0,
                  static_cast<std::size_t>(written_ - index_) * stride_);
    }
    return {index_, box_.box()};
  }

 private:
  // Keeps the unread text, moved to the front, and tops the block up from
  // the stream. A read that fails ends the text where it was.
  void fill() {
    if (at_ > 0) {
      std::memmove(block_.data(), block_.data() + at_, held_ - at_);
      blockStart_ += at_;
      held_ -= at_;
      at_ = 0;
    }
    const auto wanted =
        static_cast<std::size_t>(std::min<std::uint64_t>(block_.size() - held_, in_.remaining()));
    if (!failed_ && wanted > 0) {
      failed_ = !in_.read(block_.data() + held_, wanted);
      held_ += failed_ ? 0 : wanted;
    }
    final_ = failed_ || in_.remaining() == 0;
  }

  void readBlock() {
    const char* text = block_.data();
    const char* end = text + held_;
    const std::size_t length = held_ - at_;
    const unsigned workers = workers_.size();
    // The line ends in each worker's share of the block, counted apart;
    // the parts are found from the counts of all shares but the last.
    const WorkerGroup::Task count = [&](unsigned w) {
      if (w + 1 < workers) {
        newlines_[w] = countNewlines(text + at_ + length * w / workers,
                                     text + at_ + length * (w + 1) / workers);
      }
    };
    workers_.run(count, workers - 1);
    const std::size_t partCount = cutIntoParts(text, end, length);
    const WorkerGroup::Task parse = [&](unsigned w) {
      if (w < partCount) {
        readPart(parts_[w], end, final_, records_, stride_);
      }
    };
    workers_.run(parse, static_cast<unsigned>(partCount));
    takeParts(text, partCount);
  }

  // The parts of the block: the first from the reading's position, each
  // later one from a line whose number from there is a multiple of three
  // (where its point begins if every point before it takes three lines),
  // near the start of the worker's share. Answers how many there are.
  std::size_t cutIntoParts(const char* text, const char* end, std::size_t length) {
    const unsigned workers = workers_.size();
    parts_[0] = Part{};
    parts_[0].begin = text + at_;
    parts_[0].firstIndex = index_;
    std::size_t count = 1;
    std::uint64_t linesBefore = newlines_[0];
    for (unsigned w = 1; w < workers; ++w) {
      const char* p = text + at_ + length * w / workers;
      std::uint64_t line = linesBefore;
      linesBefore += newlines_[w];
      do {
        const void* newline = std::memchr(p, '\n', static_cast<std::size_t>(end - p));
        p = newline != nullptr ? static_cast<const char*>(newline) + 1 : nullptr;
        ++line;
      } while (p != nullptr && line % 3 != 0);
      const std::uint64_t firstIndex = static_cast<std::uint64_t>(index_) + line / 3;
      // No line of that number starts in the block, or only at its end, or
      // only where the part before begins (its share was one long line),
      // or its points are past the capacity.
      if (p == nullptr || p == end || firstIndex >= static_cast<std::uint64_t>(capacity_)) {
        break;
      }
      if (p == parts_[count - 1].begin) {
        continue;
      }
      parts_[count] = Part{};
      parts_[count].begin = p;
      parts_[count].firstIndex = static_cast<std::int32_t>(firstIndex);
      ++count;
    }
    for (std::size_t k = 0; k < count; ++k) {
      const bool last = k + 1 == count;
      parts_[k].cut = last ? end : parts_[k + 1].begin;
      parts_[k].limit = last ? capacity_ : parts_[k + 1].firstIndex;
    }
    return count;
  }

  // Takes the parts in file order while each begins where the one before
  // it ended, with the point that one was to read next.
  void takeParts(const char* text, std::size_t count) {
    for (std::size_t k = 0; k < count; ++k) {
      written_ = std::max(written_, parts_[k].firstIndex + parts_[k].count);
    }
    for (std::size_t k = 0; k < count; ++k) {
      const Part& part = parts_[k];
      if (k > 0 && (part.begin != text + at_ || part.firstIndex != index_)) {
        // Set aside, with the parts after it: the text does not take three
        // lines a point here. The next block begins where the part before
        // really ended.
        return;
      }
      box_.append(part.box);
      index_ = part.firstIndex + part.count;
      at_ = static_cast<std::size_t>(part.stop - text);
      if (part.ending == Outcome::NoMoreText || index_ >= capacity_) {
        finished_ = true;
        return;
      }
      if (part.ending == Outcome::NeedMoreText) {
        return;
      }
    }
  }

  // Reads the point at the reading's position, which is longer than a
  // block, with the scanner straight from the stream, and goes on after it
  // with an empty block.
  void readPointWithScanner() {
    const std::uint64_t position = blockStart_ + at_;
    ParsedPoint point;
    bool read = false;
    std::uint64_t after = in_.size();
    if (in_.seek(position)) {
      TextScanner scanner(in_);
      read = scanPoint(scanner, point);
      after = in_.size() - scanner.remainingBytes();
    }
    if (!read || !in_.seek(after)) {
      finished_ = true;
      return;
    }
    storePoint(records_ + static_cast<std::size_t>(index_) * stride_, stride_, point, index_);
    BoxFold one;
    one.add(point.xyz);
    box_.append(one);
    ++index_;
    written_ = std::max(written_, index_);
    blockStart_ = after;
    held_ = 0;
    at_ = 0;
  }

  InputStream& in_;
  std::uint8_t* records_;
  std::size_t stride_;
  std::int32_t capacity_;
  std::vector<char> block_;
  WorkerGroup workers_;
  std::vector<std::size_t> newlines_;
  std::vector<Part> parts_;

  // The block holds the file's bytes [blockStart_, blockStart_ + held_);
  // the reading is at at_ within it, and the file ends with it when final_.
  std::uint64_t blockStart_ = 0;
  std::size_t held_ = 0;
  std::size_t at_ = 0;
  bool final_ = false;
  bool failed_ = false;  // a read failed: the text ends with what was read

  std::int32_t index_ = 0;    // the points taken
  std::int32_t written_ = 0;  // the records written, taken or set aside
  bool finished_ = false;
  BoxFold box_;
};

}  // namespace

BundlePoints readBundlePoints(InputStream& in, std::uint8_t* records, std::size_t stride,
                              std::int32_t capacity, const BundlePointReading& reading) {
  if (capacity <= 0 || records == nullptr || stride < 16) {
    return {};
  }
  unsigned threads = reading.threads;
  if (threads == 0) {
    threads = std::thread::hardware_concurrency();  // 0 when it cannot tell
  }
  threads = std::min(threads, kMostThreads);
  const std::size_t blockBytes =
      reading.blockBytes == 0
          ? std::min(kBlockBytesPerThread * std::max(threads, 1u), kMostBlockBytes)
          : std::clamp<std::size_t>(reading.blockBytes, 2, kLargestBlock);
  if (threads <= 1 || in.remaining() <= blockBytes) {
    return scanPoints(in, records, stride, capacity);
  }
  BlockReader reader(in, records, stride, capacity, blockBytes, threads);
  return reader.read();
}

}  // namespace cloudreel
