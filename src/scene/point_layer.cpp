#include "scene/point_layer.h"

#include <sys/mman.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "platform/application_defaults.h"
#include "platform/file_location.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/user_defaults.h"
#include "platform/user_interaction.h"
#include "render/point_drawing.h"
#include "scene/my_document.h"
#include "timeline/float_value_track.h"

namespace cloudreel {

// --- PointArray

namespace {

// Arrays of this size or more are mapped in 2 MiB huge pages rather than
// taken from calloc: a new array is then filled with one page fault per
// 2 MiB instead of one per 4 KiB, which makes loading a large point file
// several times faster (docs/benchmarks.md). At this size the rounding to
// whole huge pages costs at most 6% of the array, and only where touched.
constexpr std::size_t kHugePageSize = std::size_t{2} << 20;
constexpr std::size_t kMappedArrayBytes = std::size_t{32} << 20;

// The length of the mapping behind an array of `bytes`, or 0 when it came
// from calloc. The allocation and the destructor both decide by this.
std::size_t mappingLength(std::size_t bytes) {
  return bytes >= kMappedArrayBytes ? (bytes + kHugePageSize - 1) / kHugePageSize * kHugePageSize
                                    : 0;
}

// Fresh anonymous memory (zeroed and lazily mapped like calloc's), aligned
// to a huge page so that every part of it can be one. Null when the memory
// cannot be had.
void* mapArray(std::size_t length) {
  const std::size_t reserved = length + kHugePageSize;
  void* mapped =
      ::mmap(nullptr, reserved, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (mapped == MAP_FAILED) {
    return nullptr;
  }
  const auto start = reinterpret_cast<std::uintptr_t>(mapped);
  const std::uintptr_t aligned = (start + kHugePageSize - 1) & ~(kHugePageSize - 1);
  // The slack before and after the aligned part goes back at once.
  if (aligned > start) {
    ::munmap(mapped, aligned - start);
  }
  const std::size_t after = reserved - (aligned - start) - length;
  if (after > 0) {
    ::munmap(reinterpret_cast<void*>(aligned + length), after);
  }
  // Advice only: where huge pages are off, the array is in 4 KiB pages.
  (void)::madvise(reinterpret_cast<void*>(aligned), length, MADV_HUGEPAGE);
  return reinterpret_cast<void*>(aligned);
}

}  // namespace

std::shared_ptr<PointArray> PointArray::allocate(std::size_t bytes) {
  // No memory is that large, and refusing it keeps the rounding to whole
  // huge pages from overflowing.
  if (bytes > std::numeric_limits<std::size_t>::max() / 2) {
    return nullptr;
  }
  // Zeroed either way; the operating system hands out zeroed pages lazily,
  // so a large array costs nothing until it is filled.
  const std::size_t length = mappingLength(bytes);
  void* data = length != 0 ? mapArray(length) : std::calloc(bytes == 0 ? 1 : bytes, 1);
  if (data == nullptr) {
    return nullptr;
  }
  return std::shared_ptr<PointArray>(new PointArray(static_cast<std::uint8_t*>(data), bytes));
}

PointArray::~PointArray() {
  if (const std::size_t length = mappingLength(size_); length != 0) {
    ::munmap(data_, length);
  } else {
    std::free(data_);
  }
}

// --- PointLayer

PointLayer::PointLayer() {
  const UserDefaults& defaults = UserDefaults::standardUserDefaults();
  pointSize_ = defaults.floatForKey(kPointSizeKey);
  setFixedColor(colorForDefaultsKey(defaults, kPointColorKey));
}

PointLayer::~PointLayer() { logf("deallocing point layer"); }

std::shared_ptr<PointLayer> PointLayer::initWithURLShouldLink(const std::filesystem::path& url,
                                                              bool shouldLink) {
  auto layer = std::make_shared<PointLayer>();
  return layer->loadFromURL(url, shouldLink) ? layer : nullptr;
}

bool PointLayer::loadFromURL(const std::filesystem::path& url, bool shouldLink) {
  setOriginalURL(url);
  setFileStoredAsLink(shouldLink);
  setName(lastPathComponent(url));
  Error error;
  (void)loadPointsFromURLError(url, &error);
  if (!error.message.empty()) {
    UserInteraction::shared().presentError(error);
    return false;
  }
  return true;
}

const PropertyTable& PointLayer::properties() const {
  static const PropertyTable table(
      &Layer::properties(),
      {property<PointLayer>("nPoints", &PointLayer::nPoints, &PointLayer::setNPoints),
       readOnlyProperty<PointLayer>("nFaces", &PointLayer::nFaces),
       property<PointLayer>("drawMode", &PointLayer::drawMode, &PointLayer::setDrawMode),
       property<PointLayer>("drawPointsOnly", &PointLayer::drawPointsOnly,
                            &PointLayer::setDrawPointsOnly),
       property<PointLayer>("pointSize", &PointLayer::pointSize, &PointLayer::setPointSize),
       property<PointLayer>("bucketLimit", &PointLayer::bucketLimit, &PointLayer::setBucketLimit),
       property<PointLayer>("colorMode", &PointLayer::colorMode, &PointLayer::setColorMode),
       property<PointLayer>("fixedColor", &PointLayer::fixedColor, &PointLayer::setFixedColor),
       property<PointLayer>("antialias", &PointLayer::antialias, &PointLayer::setAntialias),
       property<PointLayer>("opacity", &PointLayer::opacity, &PointLayer::setOpacity),
       property<PointLayer>("drawBoundingBox", &PointLayer::drawBoundingBox,
                            &PointLayer::setDrawBoundingBox),
       property<PointLayer>("drawWireFrame", &PointLayer::drawWireFrame,
                            &PointLayer::setDrawWireFrame),
       property<PointLayer>("attenuatePoints", &PointLayer::attenuatePoints,
                            &PointLayer::setAttenuatePoints),
       property<PointLayer>("atten_a", &PointLayer::atten_a, &PointLayer::setAtten_a),
       property<PointLayer>("atten_b", &PointLayer::atten_b, &PointLayer::setAtten_b),
       property<PointLayer>("atten_c", &PointLayer::atten_c, &PointLayer::setAtten_c),
       property<PointLayer>("fileStoredAsLink", &PointLayer::fileStoredAsLink,
                            &PointLayer::setFileStoredAsLink),
       readOnlyProperty<PointLayer>("hasTrueColor", &PointLayer::hasTrueColor)});
  return table;
}

std::span<color_point> PointLayer::colorPoints() const {
  if (hasNormals_ || !points_ || nPoints_ <= 0) {
    return {};
  }
  // Never more records than the array holds, whatever nPoints says.
  const std::size_t count =
      std::min(static_cast<std::size_t>(nPoints_), points_->size() / sizeof(color_point));
  return {reinterpret_cast<color_point*>(points_->data()), count};
}

void PointLayer::setTriangles(std::vector<std::uint32_t> triangles) {
  triangles_ = std::move(triangles);
  nFaces_ = static_cast<std::int32_t>(
      std::min<std::size_t>(triangles_.size() / 3, std::numeric_limits<std::int32_t>::max()));
}

void PointLayer::setPointArray(std::shared_ptr<PointArray> array, std::int32_t count) {
  points_ = std::move(array);
  pointsDidChange();
  setNPoints(count);
}

std::uint8_t* PointLayer::allocatePointArrayWithSize(std::int32_t count) {
  points_.reset();
  pointsDidChange();
  if (count >= 0) {
    points_ = PointArray::allocate(static_cast<std::size_t>(count) * recordSize());
  }
  if (!points_) {
    std::printf("Couldn't allocate memory!\n");
    std::fflush(stdout);
    return nullptr;
  }
  return points_->data();
}

void PointLayer::reRandomizeWithExponent(float e) {
  if (!points_ || nPoints_ <= 0) {
    return;
  }
  std::uint8_t* data = points_->data();
  const std::size_t reach = points_->size() / 16;
  const std::size_t count = std::min(static_cast<std::size_t>(nPoints_), reach);
  for (std::size_t i = 0; i < count; ++i) {
    const float u = static_cast<float>(std::rand()) * 4.656613e-10f;
    const float v = std::pow(u, e) * 255.0f;
    // v is in [0, 255] for u in [0, 1); a NaN exponent gives NaN, stored as 0.
    data[16 * i + 15] = static_cast<std::uint8_t>(v >= 0.0f && v <= 255.0f ? v : 0.0f);
  }
  pointsDidChange();
}

void PointLayer::setOriginalURL(std::filesystem::path v) {
  changeValueForKey("originalURL", originalURL_, std::move(v));
}

void PointLayer::setDrawMode(std::int32_t v) {
  if (v != listUsesDrawMode_) {
    invalidateOpenGLDisplayLists();
  }
  changeValueForKey("drawMode", drawMode_, v);
}

void PointLayer::setColorMode(std::int32_t v) {
  logf("changing color mode to %d", v);
  if (v != listUsesColorMode_) {
    invalidateOpenGLDisplayLists();
  }
  changeValueForKey("colorMode", colorMode_, v);
}

void PointLayer::setPointSize(float v) {
  willChangeValueForKey("pointSize");
  invalidateOpenGLDisplayLists();
  pointSize_ = v;
  didChangeValueForKey("pointSize");
}

void PointLayer::setFixedColor(std::shared_ptr<Color> v) {
  changeValueForKey("fixedColor", fixedColor_, v ? std::move(v) : std::make_shared<Color>());
}

std::size_t PointLayer::byteSize() const {
  return nPoints_ > 0 ? static_cast<std::size_t>(nPoints_) * 16 : 0;
}

void PointLayer::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  Layer::getAnimatablePropsInArray(tracks);
  const ObjectPtr self = weak_from_this().lock();
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "pointSize", "Point Size"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "opacity", "Opacity"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "bucketLimit", "Bucket Limit"));
}

void PointLayer::addObserversForDocument(MyDocument* document) {
  Layer::addObserversForDocument(document);
  if (document != nullptr) {
    addObserver(*document, "pointSize", ObservingOptions::Old, "Change Point Size");
  }
}

void PointLayer::removeObserversForDocument(MyDocument* document) {
  Layer::removeObserversForDocument(document);
  if (document != nullptr) {
    removeObserver(*document, "pointSize");
  }
}

void PointLayer::saveLinkedLayer() {
  if (!fileStoredAsLink_) {
    UserInteraction::shared().runAlert(
        Alert{"Cannot save", "Not an externally linked layer", {"OK"}});
    return;
  }
  Error error;
  (void)savePointsToURLError(originalURL_, &error);
  if (!error.message.empty()) {
    UserInteraction::shared().presentError(error);
    return;
  }
  setIsModified(false);
}

std::shared_ptr<Animatable3DObject> PointLayer::makeBlank() const {
  return std::make_shared<PointLayer>();
}

void PointLayer::copyInto(Animatable3DObject& target) const {
  Layer::copyInto(target);
  auto& copy = static_cast<PointLayer&>(target);
  copy.setFixedColor(fixedColor_);  // colours are immutable: sharing is copying
  copy.setPointSize(pointSize_);
  copy.setBucketLimit(bucketLimit_);
  copy.setAtten_a(atten_a_);
  copy.setAtten_b(atten_b_);
  copy.setAtten_c(atten_c_);
  copy.setOriginalURL(originalURL_);
  copy.setFileStoredAsLink(fileStoredAsLink_);
  copy.setPointArray(points_, nPoints_);
  copy.setDrawMode(drawMode_);
  copy.setAntialias(antialias_);
  copy.setDrawBoundingBox(drawBoundingBox_);
  copy.setDrawWireFrame(drawWireFrame_);
  copy.setAttenuatePoints(attenuatePoints_);
}

void PointLayer::encodeWithCoder(KeyedArchiver& coder) const {
  Layer::encodeWithCoder(coder);
  if (archivesPointRecords()) {
    const std::size_t bytes = std::min(byteSize(), points_ ? points_->size() : 0);
    coder.encodeBytes({points(), bytes}, "points");
  }
  coder.encodeInt32(drawMode_, "drawMode");
  coder.encodeInt32(nPoints_, "nPoints");
  coder.encodeBool(antialias_, "antialias");
  coder.encodeBool(drawPointsOnly_, "drawPointsOnly");
  coder.encodeBool(hasNormals_, "hasNormals");
  coder.encodeFloat(pointSize_, "pointSize");
  coder.encodeFloat(bucketLimit_, "bucketLimit");
  if (originalURL_.empty()) {
    coder.encodeObject(nullptr, "originalURL");
  } else {
    coder.encodeString(absolutePath(originalURL_).string(), "originalURL");
  }
  coder.encodeBool(fileStoredAsLink_, "fileStoredAsLink");
  coder.encodeBytes(fixedColor_->archivedData(), "fixedColor");
  coder.encodeBool(attenuatePoints_, "attenuatePoints");
  coder.encodeFloat(atten_a_, "atten_a");
  coder.encodeFloat(atten_b_, "atten_b");
  coder.encodeFloat(atten_c_, "atten_c");
}

void PointLayer::initWithCoder(KeyedUnarchiver& coder) {
  Layer::initWithCoder(coder);
  nPoints_ = coder.decodeInt32ForKey("nPoints");
  drawMode_ = coder.decodeInt32ForKey("drawMode");
  if (const Bytes color = coder.decodeBytesForKey("fixedColor"); !color.empty()) {
    Error error;
    if (auto decoded = Color::colorFromArchivedData(color, &error)) {
      fixedColor_ = std::move(decoded);
    } else {
      logWarningf("point layer \"%s\": unreadable fixed colour (%s)", name(), error.message);
    }
  }
  pointSize_ = coder.decodeFloatForKey("pointSize");
  antialias_ = coder.decodeBoolForKey("antialias");
  drawPointsOnly_ = coder.decodeBoolForKey("drawPointsOnly");
  const std::string url = coder.decodeStringForKey("originalURL");
  originalURL_ = url;
  fileStoredAsLink_ = coder.decodeBoolForKey("fileStoredAsLink");
  hasNormals_ = coder.decodeBoolForKey("hasNormals");
  opacity_ = coder.containsValueForKey("opacity") ? coder.decodeFloatForKey("opacity") : 1.0f;
  bucketLimit_ =
      coder.containsValueForKey("bucketLimit") ? coder.decodeFloatForKey("bucketLimit") : 1.0f;
  if (coder.containsValueForKey("attenuatePoints")) {
    attenuatePoints_ = coder.decodeBoolForKey("attenuatePoints");
    atten_a_ = coder.decodeFloatForKey("atten_a");
    atten_b_ = coder.decodeFloatForKey("atten_b");
    atten_c_ = coder.decodeFloatForKey("atten_c");
  } else {
    attenuatePoints_ = false;
    atten_a_ = 0.0f;
    atten_b_ = 0.0f;
    atten_c_ = 1.0f;
  }
  if (coder.hasFailed()) {
    return;
  }

  if (fileStoredAsLink_) {
    Error error;
    (void)loadPointsFromURLError(originalURL_, &error);
    if (!error.message.empty()) {
      // Said with the file's name: the document being opened only names it.
      error.message += ": " + originalURL_.string();
      UserInteraction::shared().presentError(error);
      coder.failWithError(error);
    }
    return;
  }
  if (!archivesPointRecords()) {
    nPoints_ = 0;
    return;
  }
  // Inline records are 16 bytes even when "hasNormals" is set. A count the
  // blob cannot fill is cut to the records the blob holds, so a damaged
  // document cannot make the layer claim memory it never had.
  const std::size_t blob = coder.bytesLengthForKey("points").value_or(0);
  const std::size_t wanted = nPoints_ > 0 ? static_cast<std::size_t>(nPoints_) : 0;
  const std::size_t count = std::min(wanted, blob / 16);
  if (count < wanted) {
    logWarningf("point layer \"%s\": %d points stored, %d announced", name(), static_cast<int>(count),
         static_cast<int>(wanted));
  }
  points_ = PointArray::allocate(count * 16);
  if (!points_) {
    coder.failWithError(Error{std::string(kPointFileErrorDomain), kPointFileErrorCode,
                              "Couldn't allocate memory!"});
    return;
  }
  nPoints_ = static_cast<std::int32_t>(count);
  if (count > 0) {
    // On failure the unarchiver has failed with the reason.
    (void)coder.decodeLeadingBytesForKeyInto("points", {points_->data(), count * 16});
  }
}

}  // namespace cloudreel
