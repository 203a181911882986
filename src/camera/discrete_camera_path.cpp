#include "camera/discrete_camera_path.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <limits>
#include <new>
#include <string>

#include "camera/camera.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"

namespace cloudreel {

namespace {

constexpr std::string_view kNoMemory = "Couldn't allocate memory!";

void printNoMemory() {
  std::printf("%s\n", kNoMemory.data());
  std::fflush(stdout);
}

// Numbers in text as "%d" and "%lf" scan them: leading white space skipped,
// and a number that is not there consumes nothing, so every later scan fails
// at the same place.
class ScanfNumbers {
 public:
  explicit ScanfNumbers(std::string_view text) : text_(text) {}

  std::size_t remaining() const { return text_.size() - pos_; }

  // A count beyond the int range saturates.
  bool scanInt(std::int32_t& out) {
    skipBlanks();
    std::size_t p = pos_;
    const bool negative = p < text_.size() && text_[p] == '-';
    if (p < text_.size() && (text_[p] == '-' || text_[p] == '+')) {
      ++p;
    }
    const std::size_t digits = p;
    std::int64_t value = 0;
    for (; p < text_.size() && text_[p] >= '0' && text_[p] <= '9'; ++p) {
      value = std::min<std::int64_t>(value * 10 + (text_[p] - '0'), std::int64_t{1} << 40);
    }
    if (p == digits) {
      return false;
    }
    pos_ = p;
    value = negative ? -value : value;
    out = static_cast<std::int32_t>(std::clamp<std::int64_t>(
        value, std::numeric_limits<std::int32_t>::min(), std::numeric_limits<std::int32_t>::max()));
    return true;
  }

  // Decimal and exponent forms, "inf" and "nan", with an optional sign. A
  // magnitude past the double range reads as an infinity, one below it as
  // zero, as strtod answers.
  bool scanDouble(double& out) {
    skipBlanks();
    const char* first = text_.data() + pos_;
    const char* const last = text_.data() + text_.size();
    if (first != last && *first == '+' && last - first > 1 && first[1] != '-') {
      ++first;
    }
    double value = 0.0;
    const auto [end, ec] = std::from_chars(first, last, value);
    if (ec == std::errc::invalid_argument) {
      return false;
    }
    if (ec == std::errc::result_out_of_range) {
      const std::string_view token(first, static_cast<std::size_t>(end - first));
      const std::size_t e = token.find_first_of("eE");
      const bool tiny = e != std::string_view::npos && e + 1 < token.size() && token[e + 1] == '-';
      const double magnitude = tiny ? 0.0 : std::numeric_limits<double>::infinity();
      value = token.front() == '-' ? -magnitude : magnitude;
    }
    pos_ = static_cast<std::size_t>(end - text_.data());
    out = value;
    return true;
  }

 private:
  void skipBlanks() {
    while (pos_ < text_.size() && std::strchr(" \t\n\v\f\r", text_[pos_]) != nullptr &&
           text_[pos_] != '\0') {
      ++pos_;
    }
  }

  std::string_view text_;
  std::size_t pos_ = 0;
};

// Sixteen numbers of a 4×4 matrix written row by row: the upper-left block
// is the rotation, the last column the position; the bottom row's first
// three go to storage 3, 7 and 11, and the last is replaced so that the
// stored matrix has no translation and a 1 in its corner.
void fillFromMatrixLine(const std::array<double, 16>& v, CameraPathRecord& record) {
  for (std::size_t r = 0; r < 3; ++r) {
    for (std::size_t c = 0; c < 3; ++c) {
      record.matrix[4 * c + r] = v[4 * r + c];
    }
    record.position[r] = v[4 * r + 3];
  }
  record.matrix[3] = v[12];
  record.matrix[7] = v[13];
  record.matrix[11] = v[14];
  record.matrix[12] = record.matrix[13] = record.matrix[14] = 0.0;
  record.matrix[15] = 1.0;
}

std::string readWholeFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

}  // namespace

std::shared_ptr<DiscreteCameraPath> DiscreteCameraPath::initWithText(std::string_view text) {
  auto path = std::make_shared<DiscreteCameraPath>();
  if (!path->readRecordsFromText(text, 16, fillFromMatrixLine)) {
    return nullptr;
  }
  return path;
}

std::shared_ptr<DiscreteCameraPath> DiscreteCameraPath::initWithURL(
    const std::filesystem::path& url) {
  auto path = initWithText(readWholeFile(url));
  if (path) {
    path->setName(url.filename().string());
  }
  return path;
}

bool DiscreteCameraPath::readRecordsFromText(std::string_view text, std::size_t numbersPerRecord,
                                             RecordFiller fill) {
  ScanfNumbers scanner(text);
  std::int32_t count = nFrames();
  (void)scanner.scanInt(count);
  // A negative count, taken as a size, asks for more memory than exists.
  if (count < 0) {
    printNoMemory();
    return false;
  }
  // A record takes at least one character a number and a blank between
  // numbers, so the text can hold no more than this many; a count beyond it
  // (a damaged or hostile file) is cut here rather than reserving memory for
  // frames the file never had. Frames within the bound but past the
  // numbers read are zero poses, as frames with unread numbers are.
  const std::size_t capacity = (scanner.remaining() + 1) / (2 * numbersPerRecord);
  const std::size_t frames = std::min(static_cast<std::size_t>(count), capacity);
  std::vector<CameraPathRecord> records;
  try {
    records.resize(frames);
  } catch (const std::bad_alloc&) {
    printNoMemory();
    return false;
  }
  for (CameraPathRecord& record : records) {
    std::array<double, 16> numbers{};
    for (std::size_t k = 0; k < numbersPerRecord; ++k) {
      (void)scanner.scanDouble(numbers[k]);
    }
    fill(numbers, record);
  }
  setPoints(std::move(records));
  return true;
}

void DiscreteCameraPath::setPoints(std::vector<CameraPathRecord> records) {
  records_ = std::move(records);
  setNFrames(static_cast<std::int32_t>(
      std::min<std::size_t>(records_.size(), std::numeric_limits<std::int32_t>::max())));
}

std::shared_ptr<Camera> DiscreteCameraPath::cameraInObjectSpaceForFrame(std::int32_t frame) const {
  // nFrames can be set apart from the records (by key); the records bound
  // the index as well.
  if (frame < 0 || frame >= nFrames() || static_cast<std::size_t>(frame) >= records_.size()) {
    return nullptr;
  }
  const CameraPathRecord& record = records_[static_cast<std::size_t>(frame)];
  const double gain = translateGain();
  return Camera::initWithMatrixTranslate(
      record.matrix,
      {record.position[0] * gain, record.position[1] * gain, record.position[2] * gain});
}

std::shared_ptr<Camera> DiscreteCameraPath::cameraInObjectSpaceForTime(float t) const {
  return cameraInObjectSpaceForFrame(frameForTime(nFrames(), t));
}

std::shared_ptr<Animatable3DObject> DiscreteCameraPath::makeBlank() const {
  return std::make_shared<DiscreteCameraPath>();
}

void DiscreteCameraPath::copyInto(Animatable3DObject& target) const {
  CameraPath::copyInto(target);
  static_cast<DiscreteCameraPath&>(target).setPoints(records_);
}

void DiscreteCameraPath::encodeWithCoder(KeyedArchiver& coder) const {
  CameraPath::encodeWithCoder(coder);
  coder.encodeBytes({reinterpret_cast<const std::uint8_t*>(records_.data()), byteSize()}, "points");
}

void DiscreteCameraPath::initWithCoder(KeyedUnarchiver& coder) {
  CameraPath::initWithCoder(coder);
  records_.clear();
  if (coder.hasFailed()) {
    return;
  }
  // Records the blob holds, a partly stored last one zero-filled beyond its
  // bytes. A count the blob cannot back is cut to what it holds, so a
  // damaged document cannot make the path claim memory it never had.
  const std::size_t blob = coder.bytesLengthForKey("points").value_or(0);
  const std::size_t wanted = nFrames() > 0 ? static_cast<std::size_t>(nFrames()) : 0;
  const std::size_t count =
      std::min(wanted, (blob + sizeof(CameraPathRecord) - 1) / sizeof(CameraPathRecord));
  std::vector<CameraPathRecord> records;
  try {
    records.resize(count);
  } catch (const std::bad_alloc&) {
    coder.failWithError(Error{"CameraPath", 100, std::string(kNoMemory)});
    return;
  }
  const std::size_t bytes = std::min(blob, count * sizeof(CameraPathRecord));
  if (bytes > 0) {
    // On failure the unarchiver has failed with the reason.
    (void)coder.decodeLeadingBytesForKeyInto(
        "points", {reinterpret_cast<std::uint8_t*>(records.data()), bytes});
  }
  setPoints(std::move(records));
}

}  // namespace cloudreel
