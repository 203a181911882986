#include "import/bundler_file.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <limits>
#include <optional>
#include <string>

#include "camera/bundler_camera.h"
#include "camera/camera_field.h"
#include "import/text_scanner.h"
#include "platform/byte_stream.h"
#include "platform/file_location.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

namespace {

// The fewest bytes a point record can take: six one-digit numbers and the
// five separators between them ("0 0 0\n0 0 0"), the view list left out.
constexpr std::uint64_t kSmallestPointRecord = 11;

bool fail(Error* error, std::string message) {
  setError(error, std::string(kPointFileErrorDomain), kPointFileErrorCode, std::move(message));
  return true;
}

// The lines of the photograph list, split at every CR and every LF (so a
// CR LF pair leaves an empty line between two); none when the file is
// missing or cannot be read. The bytes are taken as they are: file names
// are bytes here.
std::optional<std::vector<std::string>> readPhotographList(const std::filesystem::path& file) {
  const auto in = FileInputStream::open(file, nullptr);
  if (!in) {
    return std::nullopt;
  }
  std::string text(static_cast<std::size_t>(in->size()), '\0');
  if (!in->read(text.data(), text.size())) {
    return std::nullopt;
  }
  std::vector<std::string> lines(1);
  for (const char c : text) {
    if (c == '\r' || c == '\n') {
      lines.emplace_back();
    } else {
      lines.back() += c;
    }
  }
  return lines;
}

// A line's photograph: its text up to the first space, relative to the
// reconstruction's root folder (a leading "/" is joined, not taken as the
// root of the file system). Empty when the line names nothing.
std::filesystem::path photographOf(const std::filesystem::path& root, const std::string& line) {
  const std::filesystem::path name(line.substr(0, line.find(' ')));
  return name.empty() ? std::filesystem::path() : root / name.relative_path();
}

std::int64_t clampedToInt32(std::int64_t v) {
  return std::clamp<std::int64_t>(v, 0, std::numeric_limits<std::int32_t>::max());
}

}  // namespace

std::shared_ptr<BundlerFile> BundlerFile::initWithURLShouldLink(const std::filesystem::path& url,
                                                                bool shouldLink) {
  auto layer = std::make_shared<BundlerFile>();
  return layer->loadFromURL(url, shouldLink) ? layer : nullptr;
}

bool BundlerFile::loadPointsFromURLError(const std::filesystem::path& url, Error* error) {
  cameras_.clear();
  // The reconstruction's root holds "list.txt"; the bundle file sits one
  // folder below it (root/bundle/bundle.out).
  const std::filesystem::path root = removingLastPathComponents(absolutePath(url), 2);
  const auto photographs = readPhotographList(root / "list.txt");

  const auto in = FileInputStream::open(url, nullptr);
  if (!in) {
    return fail(error, "Cannot open file");
  }
  TextScanner scanner(*in);
  if (!scanner.readLine()) {
    return fail(error, "File corrupt: short read");
  }
  std::int64_t cameraCount = 0;
  std::int64_t pointCount = 0;
  (void)scanner.scan(cameraCount);
  (void)scanner.scan(pointCount);
  cameraCount = clampedToInt32(cameraCount);
  pointCount = clampedToInt32(pointCount);

  // Every scan consumes text, so this stops at the file's end however large
  // the count.
  auto field = std::make_shared<CameraField>();
  std::int32_t made = 0;
  for (; made < cameraCount && !scanner.atEnd(); ++made) {
    auto camera = BundlerCamera::initWithFileHandleFileIndex(scanner, made);
    if (photographs && static_cast<std::size_t>(made) < photographs->size()) {
      if (auto photograph = photographOf(root, (*photographs)[static_cast<std::size_t>(made)]);
          !photograph.empty()) {
        camera->setImagePath(photograph);
      }
    }
    field->addCamera(std::move(camera));
  }
  ncameras_ = made;
  addChildLayer(field);

  const auto capacity = static_cast<std::int32_t>(std::min<std::uint64_t>(
      static_cast<std::uint64_t>(pointCount), scanner.remainingBytes() / kSmallestPointRecord));
  if (capacity == 0) {
    setNPoints(0);
    return false;
  }
  std::uint8_t* const records = allocatePointArrayWithSize(capacity);
  if (records == nullptr) {
    setNPoints(0);
    return fail(error, "Cannot allocate point array");
  }
  // Positions first, colour and luck in the last four bytes, whichever
  // record layout the layer has.
  const std::size_t stride = recordSize();
  BoundingBox box{};
  std::int32_t read = 0;
  for (; read < capacity && !scanner.atEnd(); ++read) {
    std::array<float, 3> xyz{};
    std::array<std::int64_t, 3> rgb{};
    for (float& v : xyz) {
      (void)scanner.scan(v);
    }
    for (std::int64_t& v : rgb) {
      (void)scanner.scan(v);
    }
    // The rest of the colour line, then the view list.
    (void)scanner.readLine();
    (void)scanner.readLine();

    std::uint8_t* record = records + static_cast<std::size_t>(read) * stride;
    std::memcpy(record, xyz.data(), sizeof xyz);
    // The low eight bits, unclamped: 300 is stored as 44, -1 as 255.
    for (std::size_t c = 0; c < 3; ++c) {
      record[stride - 4 + c] = static_cast<std::uint8_t>(rgb[c]);
    }
    record[stride - 1] = static_cast<std::uint8_t>(read);

    for (std::size_t axis = 0; axis < 3; ++axis) {
      const double v = xyz[axis];
      if (read == 0 || v < box[axis]) {
        box[axis] = v;
      }
      if (read == 0 || v > box[axis + 3]) {
        box[axis + 3] = v;
      }
    }
  }
  if (read > 0) {
    setBoundingBox(box);
  }
  setNPoints(read);
  pointsDidChange();
  return false;
}

bool BundlerFile::savePointsToURLError(const std::filesystem::path&, Error*) const { return false; }

void BundlerFile::encodeWithCoder(KeyedArchiver& coder) const {
  PointLayer::encodeWithCoder(coder);
  if (!fileStoredAsLink()) {
    coder.encodeList(cameras_, "cameras");
  }
}

void BundlerFile::initWithCoder(KeyedUnarchiver& coder) {
  PointLayer::initWithCoder(coder);
  if (!fileStoredAsLink() && coder.containsValueForKey("cameras")) {
    cameras_ = coder.decodeListOfClassForKey<Camera>("cameras").value_or(
        std::vector<std::shared_ptr<Camera>>{});
  }
  ncameras_ = static_cast<std::int32_t>(
      std::min<std::size_t>(cameras_.size(), std::numeric_limits<std::int32_t>::max()));
}

std::shared_ptr<Animatable3DObject> BundlerFile::makeBlank() const {
  return std::make_shared<BundlerFile>();
}

void BundlerFile::copyInto(Animatable3DObject& target) const {
  PointLayer::copyInto(target);
  auto& copy = static_cast<BundlerFile&>(target);
  copy.ncameras_ = ncameras_;
  copy.cameras_ = cameras_;
}

}  // namespace cloudreel
