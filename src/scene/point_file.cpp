// The point file (".rwb"): one point layer's records, bounding box and
// triangles as raw little-endian binary, so that a large cloud loads with a
// handful of bulk reads.
//
//   0  "RWBP"                 20  face count, uint32
//   4  version, uint32 (0)    24  normals flag, byte (records of 28 bytes)
//   8  byte-order word (0)    25  reserved (15 bytes)
//  12  point count, uint32    40  bounding box: six float64
//  16  reserved               88  the records, then face count × 3 uint32
//
// No byte swapping is done: the byte-order word is written as 0 and any
// other value is refused.

#include <array>
#include <cstring>
#include <limits>

#include "platform/application_defaults.h"
#include "platform/atomic_file.h"
#include "platform/byte_stream.h"
#include "platform/file_location.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "platform/user_interaction.h"
#include "scene/point_layer.h"

namespace cloudreel {

namespace {

constexpr std::size_t kHeaderSize = 40;
constexpr std::size_t kBoxSize = 48;

// Stores the point file error (when the caller asked for it) and answers
// YES, the failure result of the point file operations.
bool fail(Error* error, std::string message) {
  setError(error, std::string(kPointFileErrorDomain), kPointFileErrorCode, std::move(message));
  return true;
}

std::uint32_t wordAt(const std::uint8_t* header, std::size_t offset) {
  std::uint32_t v = 0;
  std::memcpy(&v, header + offset, 4);
  return v;
}

// Writes into a temporary beside the file and renames it into place, so a
// failed save leaves the previous file whole. It keeps the system's reason
// for the first failure (no space, no permission, a folder in the way), which
// the save adds to its own message.
class Writer {
 public:
  explicit Writer(const std::filesystem::path& path) : replacement_(path) {
    out_ = FileOutputStream::create(replacement_.temporaryPath(), &reason_);
  }
  bool write(const void* data, std::size_t size) {
    return out_ && (out_->write(data, size) || keepReason());
  }
  bool finish() {
    if (!out_) {
      return false;
    }
    if (!out_->sync() || !out_->close()) {
      return keepReason();
    }
    return replacement_.commit(&reason_);
  }
  // The design's message, then why when the system said why.
  std::string failure(const char* message) const {
    return reason_.code != 0 ? std::string(message) + ": " + std::strerror(reason_.code)
                             : std::string(message);
  }

 private:
  bool keepReason() {
    reason_ = out_->error();
    return false;
  }

  AtomicFileReplacement replacement_;
  Error reason_;
  std::unique_ptr<FileOutputStream> out_;
};

}  // namespace

bool PointLayer::savePointsToURLError(const std::filesystem::path& url, Error* error) const {
  Writer file(url);
  std::array<std::uint8_t, kHeaderSize> header{};
  std::memcpy(header.data(), "RWBP", 4);
  const std::uint32_t pointCount = nPoints_ > 0 ? static_cast<std::uint32_t>(nPoints_) : 0;
  const std::uint32_t faceCount = nFaces_ > 0 ? static_cast<std::uint32_t>(nFaces_) : 0;
  std::memcpy(header.data() + 12, &pointCount, 4);
  std::memcpy(header.data() + 20, &faceCount, 4);
  // A file that cannot be created fails here, at its first write.
  if (!file.write(header.data(), header.size())) {
    return fail(error, file.failure("Cannot write header"));
  }
  if (!file.write(bbox().data(), kBoxSize)) {
    return fail(error, file.failure("Cannot write bounding box"));
  }
  // The writer always writes 16-byte records; never more than the array has.
  const std::size_t bytes =
      std::min<std::size_t>(std::size_t{pointCount} * 16, points_ ? points_->size() : 0);
  if (bytes < std::size_t{pointCount} * 16 ||
      !file.write(points_ ? points_->data() : nullptr, bytes)) {
    return fail(error, file.failure("Cannot write points: short read"));
  }
  if (faceCount != 0) {
    const std::size_t indices =
        std::min<std::size_t>(std::size_t{faceCount} * 3, triangles_.size());
    (void)file.write(triangles_.data(), indices * 4);
  }
  if (!file.finish()) {
    return fail(error, file.failure("Cannot save file"));
  }
  return false;
}

bool PointLayer::loadPointsFromURLError(const std::filesystem::path& url, Error* error) {
  const std::unique_ptr<FileInputStream> in = fileHandleForURL(url);
  if (!in) {
    return fail(error, "Cannot open file");
  }
  std::array<std::uint8_t, kHeaderSize> header{};
  if (!in->read(header.data(), header.size())) {
    return fail(error, "File is corrupt: short read");
  }
  if (std::memcmp(header.data(), "RWBP", 4) != 0) {
    return fail(error, "Not a RWB file");
  }
  if (wordAt(header.data(), 4) != 0) {
    return fail(error, "Unsupported RWB file version");
  }
  if (wordAt(header.data(), 8) != 0) {
    return fail(error, "Wrong file endianness");
  }

  const std::uint32_t announcedPoints = wordAt(header.data(), 12);
  const std::uint32_t faces = wordAt(header.data(), 20);
  hasNormals_ = header[24] != 0;
  const std::size_t record = recordSize();
  // The array is sized by what the file can hold, never by the count alone:
  // a count beyond the file's records reads the records that are there and
  // reports a short read, as reading them would, without first claiming
  // memory for records that do not exist.
  const std::uint64_t available =
      in->size() > kHeaderSize + kBoxSize ? (in->size() - kHeaderSize - kBoxSize) / record : 0;
  const std::uint64_t readable = std::min<std::uint64_t>(
      {announcedPoints, available, std::numeric_limits<std::int32_t>::max()});
  const bool shortRead = readable < announcedPoints;
  // The old triangles index the old records and go with them; the face
  // count comes back only with the triangles the file really holds. So a
  // load that fails from here on leaves points without faces, never a face
  // count with no triangles behind it.
  triangles_.clear();
  nFaces_ = 0;
  setNPoints(static_cast<std::int32_t>(readable));
  if (allocatePointArrayWithSize(nPoints_) == nullptr) {
    return fail(error, "Cannot allocate memory for points");
  }

  BoundingBox box{};
  if (!in->read(box.data(), kBoxSize)) {
    return fail(error, "Cannot read bounding box");
  }
  setBoundingBox(box);

  if (readable > 0 && !in->read(points_->data(), static_cast<std::size_t>(readable) * record)) {
    setNPoints(0);
    return fail(error, "Cannot read points: short read");
  }
  // A short read is reported through the error alone: the result still says
  // success, as it always has, and callers decide by the error.
  if (shortRead) {
    (void)fail(error, "Cannot read points: short read");
  }

  if (faces != 0) {
    // The triangles are read unchecked: the indices the file holds. The
    // array is never larger than the file could fill, and the face count
    // shrinks to the whole faces read.
    const std::uint64_t left = in->size() - in->position();
    const std::uint64_t indices = std::min<std::uint64_t>(std::uint64_t{faces} * 3, left / 4);
    triangles_.assign(static_cast<std::size_t>(indices - indices % 3), 0);
    (void)in->read(triangles_.data(), triangles_.size() * 4);
    nFaces_ = static_cast<std::int32_t>(std::min<std::uint64_t>(
        triangles_.size() / 3,
        static_cast<std::uint64_t>(std::numeric_limits<std::int32_t>::max())));
    logf("read %d faces", nFaces_);
  }
  return false;
}

std::unique_ptr<FileInputStream> PointLayer::fileHandleForURL(const std::filesystem::path& url) {
  std::error_code ec;
  if (std::filesystem::is_regular_file(url, ec)) {
    return FileInputStream::open(url, nullptr);
  }
  const std::filesystem::path cached =
      UserDefaults::standardUserDefaults().stringForKey(kPointCachePathKey) + "/" +
      lastPathComponent(url);
  if (std::filesystem::is_regular_file(cached, ec)) {
    return FileInputStream::open(cached, nullptr);
  }
  const auto located = UserInteraction::shared().runOpenPanel(
      OpenPanel{"Please locate " + lastPathComponent(url), true, false, {}});
  if (!located) {
    return nullptr;
  }
  return FileInputStream::open(*located, nullptr);
}

}  // namespace cloudreel
