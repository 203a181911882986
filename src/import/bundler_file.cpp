#include "import/bundler_file.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "camera/bundler_camera.h"
#include "camera/camera_field.h"
#include "import/bundle_points.h"
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
// The fewest bytes a camera record can take: fifteen one-digit numbers and
// the fourteen separators between them (five lines of "0 0 0").
constexpr std::uint64_t kSmallestCameraRecord = 29;
// The camera counts refused as no real reconstruction's (see the loader).
constexpr std::uint64_t kCamerasAnyFileMayClaim = 4096;
constexpr std::uint64_t kFileBytesPerCamera = 256;
// The longest path the file system takes (PATH_MAX less its terminating
// NUL); a longer name is not looked for.
constexpr std::size_t kLongestPath = 4095;

bool fail(Error* error, std::string message) {
  setError(error, std::string(kApplicationErrorDomain), kPointFileErrorCode, std::move(message));
  return true;
}

// The lines of the photograph list, handed out one at a time in file order.
// Lines end at every CR and every LF (so a CR LF pair leaves an empty line
// between two). The bytes are taken as they are: file names are bytes here.
// Only the text is held, so a list of many short lines costs no more memory
// than its size.
class PhotographList {
 public:
  // The list in `file`; empty (no lines at all) when the file is missing or
  // cannot be read.
  explicit PhotographList(const std::filesystem::path& file) {
    const auto in = FileInputStream::open(file, nullptr);
    if (!in) {
      return;
    }
    text_.resize(static_cast<std::size_t>(in->size()));
    if (!in->read(text_.data(), text_.size())) {
      return;
    }
    next_ = 0;
  }

  // The next line; nothing once every line has been handed out. A text of
  // n line ends has n + 1 lines, the last empty when the text ends with one.
  std::optional<std::string_view> nextLine() {
    if (next_ > text_.size()) {
      return std::nullopt;
    }
    const std::string_view rest = std::string_view(text_).substr(next_);
    const std::size_t end = std::min(rest.find_first_of("\r\n"), rest.size());
    next_ += end + 1;
    return rest.substr(0, end);
  }

 private:
  std::string text_;
  // Where the next line starts; past the end when there is none (or no list).
  std::size_t next_ = std::string::npos;
};

bool namesAFile(const std::filesystem::path& path) {
  std::error_code ignored;
  return std::filesystem::is_regular_file(path, ignored);
}

// A line's photograph: its text up to the first space, relative to the
// reconstruction's root folder (a leading "/" is joined, not taken as the
// root of the file system). A list written on another machine names that
// machine's paths ("/home/x/proj/images/a.jpg"), so when the joined path
// names no file, the longest trailing part of the name that names a file
// under the root is taken ("images/a.jpg", else "a.jpg"); when none does,
// the joined path stands (and gives no photograph). Empty when the line
// names nothing.
std::filesystem::path photographOf(const std::filesystem::path& root, std::string_view line) {
  const std::string_view entry = line.substr(0, line.find(' '));
  if (entry.empty()) {
    return {};
  }
  const std::filesystem::path name = std::filesystem::path(entry).relative_path();
  const std::filesystem::path joined = root / name;
  if (namesAFile(joined)) {
    return joined;
  }
  std::string_view rest = name.native();
  for (std::size_t slash = rest.find('/'); slash != std::string_view::npos;
       slash = rest.find('/')) {
    rest.remove_prefix(slash + 1);
    // An empty part, or one too long for any path, names nothing; the
    // shorter parts after it are still tried.
    if (rest.empty() || rest.front() == '/' || rest.size() + root.native().size() >= kLongestPath) {
      continue;
    }
    std::filesystem::path trailing = root / rest;
    if (namesAFile(trailing)) {
      return trailing;
    }
  }
  return joined;
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
  PhotographList photographs(root / "list.txt");

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
  // A camera is a placed object of a few kilobytes, while its record can be
  // as short as 30 bytes, so a file of zeros under a huge count would claim
  // some eighty times its size in cameras. No real reconstruction has a
  // camera for every 256 bytes of its file (its points alone take far
  // more), so a larger count is refused, unless it is one any file may
  // claim. The cameras then cost at most about ten times the file's size.
  const std::uint64_t plausibleCameras =
      std::max<std::uint64_t>(kCamerasAnyFileMayClaim, in->size() / kFileBytesPerCamera);
  if (cameraCount > 0 && static_cast<std::uint64_t>(cameraCount) > plausibleCameras) {
    return fail(error, "The file claims " + std::to_string(cameraCount) +
                           " cameras, more than a reconstruction of " + std::to_string(in->size()) +
                           " bytes has");
  }
  // The rest of the file cannot begin more cameras than this, counting one
  // it only begins, so an absurd count costs nothing. A scan consumes text,
  // so the reading also stops where the file ends.
  const std::uint64_t camerasBegun =
      (scanner.remainingBytes() + kSmallestCameraRecord - 1) / kSmallestCameraRecord;
  cameraCount = static_cast<std::int64_t>(
      std::min(static_cast<std::uint64_t>(clampedToInt32(cameraCount)), camerasBegun));
  pointCount = clampedToInt32(pointCount);

  std::vector<std::shared_ptr<Camera>> cameras;
  std::int32_t made = 0;
  for (; made < cameraCount && !scanner.atEnd(); ++made) {
    auto camera = BundlerCamera::initWithFileHandleFileIndex(scanner, made);
    if (const auto line = photographs.nextLine()) {
      if (auto photograph = photographOf(root, *line); !photograph.empty()) {
        camera->setImagePath(photograph);
      }
    }
    cameras.push_back(std::move(camera));
  }
  ncameras_ = made;
  // A linked layer is read again each time its document opens, and the
  // document already holds its camera field, perhaps as a camera path or a
  // track's object too: that field is refilled rather than joined by a
  // second one.
  auto field = childLayerCount() > 0 ? std::dynamic_pointer_cast<CameraField>(childLayers().front())
                                     : nullptr;
  if (field) {
    field->setCameras(std::move(cameras));
  } else {
    field = std::make_shared<CameraField>();
    field->setCameras(std::move(cameras));
    addChildLayer(field);
  }

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
  // The points begin where the scanner is; its read-ahead is read again.
  if (!in->seek(in->size() - scanner.remainingBytes())) {
    setNPoints(0);
    return false;
  }
  // Positions first, colour and luck in the last four bytes, whichever
  // record layout the layer has.
  const BundlePoints read = readBundlePoints(*in, records, recordSize(), capacity, pointReading_);
  if (read.box) {
    setBoundingBox(*read.box);
  }
  setNPoints(read.count);
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
