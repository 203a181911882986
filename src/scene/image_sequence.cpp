#include "scene/image_sequence.h"

#include <stb/stb_image.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <fstream>
#include <memory>
#include <new>
#include <system_error>
#include <utility>

#include "render/gl/image_file.h"

namespace cloudreel {

namespace {

namespace fs = std::filesystem;

// The widest number a pattern matches: nine digits always fit an int.
constexpr int kMaxNumberDigits = 9;
// The widest field a conversion may ask for; wider ones are not taken as
// conversions (a "%999999d" would print megabytes of padding).
constexpr int kMaxFieldWidth = 32;

bool fail(Error* error, ImageSequenceErrorCode code, std::string message) {
  setError(error, std::string(kImageSequenceErrorDomain), static_cast<int>(code),
           std::move(message));
  return false;
}

std::string quoted(const std::string& text) { return "“" + text + "”"; }

std::string lowercase(std::string text) {
  for (char& c : text) {
    c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  }
  return text;
}

bool isTiff(const fs::path& file) {
  const std::string extension = lowercase(file.extension().string());
  return extension == ".tif" || extension == ".tiff";
}

bool isDigit(char c) { return c >= '0' && c <= '9'; }

// --- TIFF -----------------------------------------------------------------

// A 16-bit TIFF sample scaled to 8 bits, rounded to nearest.
std::uint8_t toByte16(std::uint16_t sample) {
  return static_cast<std::uint8_t>((std::uint32_t{sample} * 255u + 32767u) / 65535u);
}

// The file's bytes in one read; false when it cannot be opened or read.
bool readWholeFile(const fs::path& file, std::vector<std::uint8_t>& contents) {
  std::ifstream in(file, std::ios::binary | std::ios::ate);
  const std::streamoff size = in ? static_cast<std::streamoff>(in.tellg()) : -1;
  if (size < 0) {
    return false;
  }
  contents.resize(static_cast<std::size_t>(size));
  in.seekg(0);
  return static_cast<bool>(in.read(reinterpret_cast<char*>(contents.data()), size));
}

std::optional<DecodedImage> decodeTiffFile(const fs::path& file, Error* error) {
  std::vector<std::uint8_t> contents;
  if (!readWholeFile(file, contents)) {
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(file.string()) + ": the file cannot be read.");
    return std::nullopt;
  }
  Error tiffError;
  std::optional<gl::TiffImage> tiff = gl::decodeTiff(contents, &tiffError);
  contents = {};
  if (!tiff) {
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(file.string()) +
             ": not an image: " + tiffError.message);
    return std::nullopt;
  }
  const int samples = tiff->samplesPerPixel;
  const bool grey = samples <= 2;
  const bool greyPhotometric = tiff->photometric == 0 || tiff->photometric == 1;
  if (grey != greyPhotometric || (!grey && tiff->photometric != 2)) {
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(file.string()) +
             ": not an image: only grey and RGB TIFF files are read (photometric " +
             std::to_string(tiff->photometric) + ").");
    return std::nullopt;
  }
  // 0 is white in a min-is-white file.
  const bool invert = tiff->photometric == 0;
  // Orientation 4 stores the bottom row first; every other orientation is
  // read as top row first (mirrored and rotated layouts are rare in frames).
  const bool bottomUp = tiff->orientation == 4;
  DecodedImage image;
  image.width = tiff->width;
  image.height = tiff->height;
  image.pixels.resize(static_cast<std::size_t>(image.width) *
                      static_cast<std::size_t>(image.height) * 4);
  // The samples as bytes first, in one pass, then laid out as RGBA.
  std::vector<std::uint8_t> bytes(tiff->samples.size());
  if (tiff->bitsPerSample == 16) {
    std::transform(tiff->samples.begin(), tiff->samples.end(), bytes.begin(), toByte16);
  } else {
    std::transform(tiff->samples.begin(), tiff->samples.end(), bytes.begin(),
                   [](std::uint16_t v) { return static_cast<std::uint8_t>(v); });
  }
  tiff.reset();
  const std::size_t width = static_cast<std::size_t>(image.width);
  const std::size_t stride = width * static_cast<std::size_t>(samples);
  std::uint8_t* to = image.pixels.data();
  for (int row = 0; row < image.height; ++row) {
    const std::size_t y = static_cast<std::size_t>(bottomUp ? image.height - 1 - row : row);
    const std::uint8_t* from = bytes.data() + y * stride;
    for (std::size_t x = 0; x < width; ++x, from += samples, to += 4) {
      if (grey) {
        const std::uint8_t v = invert ? static_cast<std::uint8_t>(255 - from[0]) : from[0];
        to[0] = v;
        to[1] = v;
        to[2] = v;
        to[3] = samples == 2 ? from[1] : std::uint8_t{255};
      } else {
        to[0] = from[0];
        to[1] = from[1];
        to[2] = from[2];
        to[3] = samples == 4 ? from[3] : std::uint8_t{255};
      }
    }
  }
  return image;
}

// Reads width and height from a classic TIFF's first directory. BigTIFF and
// anything inconsistent answer false.
bool readTiffSize(const fs::path& file, int* width, int* height) {
  std::ifstream in(file, std::ios::binary);
  std::array<unsigned char, 8> header{};
  if (!in.read(reinterpret_cast<char*>(header.data()), header.size())) {
    return false;
  }
  const bool little = header[0] == 'I' && header[1] == 'I';
  if (!little && !(header[0] == 'M' && header[1] == 'M')) {
    return false;
  }
  auto number = [little](const unsigned char* p, int bytes) {
    std::uint32_t v = 0;
    for (int i = 0; i < bytes; ++i) {
      const std::uint32_t b = p[little ? bytes - 1 - i : i];
      v = (v << 8) | b;
    }
    return v;
  };
  if (number(header.data() + 2, 2) != 42) {
    return false;
  }
  in.seekg(number(header.data() + 4, 4));
  std::array<unsigned char, 2> countBytes{};
  if (!in.read(reinterpret_cast<char*>(countBytes.data()), countBytes.size())) {
    return false;
  }
  const std::uint32_t entries = number(countBytes.data(), 2);
  std::uint32_t w = 0, h = 0;
  for (std::uint32_t i = 0; i < entries && (w == 0 || h == 0); ++i) {
    std::array<unsigned char, 12> entry{};
    if (!in.read(reinterpret_cast<char*>(entry.data()), entry.size())) {
      return false;
    }
    const std::uint32_t tag = number(entry.data(), 2);
    const std::uint32_t type = number(entry.data() + 2, 2);
    // SHORT (3) values sit in the first two bytes of the value field.
    const std::uint32_t value = type == 3   ? number(entry.data() + 8, 2)
                                : type == 4 ? number(entry.data() + 8, 4)
                                            : 0;
    if (tag == 256) {
      w = value;
    } else if (tag == 257) {
      h = value;
    }
  }
  if (w == 0 || h == 0 || w > 0x7fffffffu || h > 0x7fffffffu) {
    return false;
  }
  *width = static_cast<int>(w);
  *height = static_cast<int>(h);
  return true;
}

// --- stb_image --------------------------------------------------------------

std::optional<DecodedImage> decodeStbFile(const fs::path& file, Error* error) {
  const std::string name = file.string();
  auto refuse = [&](const std::string& why) {
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(name) + ": not an image: " + why);
    return std::nullopt;
  };
  int w = 0, h = 0, components = 0;
  if (stbi_info(name.c_str(), &w, &h, &components) == 0) {
    const char* reason = stbi_failure_reason();
    return refuse(reason != nullptr ? reason : "unknown format");
  }
  if (w <= 0 || h <= 0 || std::int64_t{w} * std::int64_t{h} > kMaxImagePixels) {
    return refuse("its size " + std::to_string(w) + "×" + std::to_string(h) +
                  " is empty or too large");
  }
  struct Free {
    void operator()(stbi_uc* p) const { stbi_image_free(p); }
  };
  // The stb failure reason is per thread, so workers decoding side by side
  // do not see each other's reasons.
  std::unique_ptr<stbi_uc, Free> pixels(stbi_load(name.c_str(), &w, &h, &components, 4));
  if (!pixels || w <= 0 || h <= 0) {
    const char* reason = stbi_failure_reason();
    return refuse(reason != nullptr ? reason : "corrupt data");
  }
  DecodedImage image;
  image.width = w;
  image.height = h;
  const std::size_t bytes = static_cast<std::size_t>(w) * static_cast<std::size_t>(h) * 4;
  image.pixels.assign(pixels.get(), pixels.get() + bytes);
  return image;
}

// --- patterns -----------------------------------------------------------------

// Reads an integer conversion starting at source[i] == '%': an optional '0'
// flag, a width, then d, i or u. Answers the index after it, or 0 when it is
// not one.
std::size_t conversionEnd(const std::string& source, std::size_t i, int* width, char* pad) {
  std::size_t j = i + 1;
  *pad = ' ';
  if (j < source.size() && source[j] == '0') {
    *pad = '0';
    ++j;
  }
  int w = 0;
  while (j < source.size() && isDigit(source[j])) {
    w = w * 10 + (source[j] - '0');
    if (w > kMaxFieldWidth) {
      return 0;
    }
    ++j;
  }
  if (j < source.size() && (source[j] == 'd' || source[j] == 'i' || source[j] == 'u')) {
    *width = w;
    return j + 1;
  }
  return 0;
}

}  // namespace

// --- pictures -----------------------------------------------------------------

std::optional<DecodedImage> decodeImageFile(const fs::path& file, Error* error) {
  std::error_code ec;
  const fs::file_status status = fs::status(file, ec);
  if (!fs::exists(status)) {
    fail(error, ImageSequenceErrorCode::NoSuchFile,
         "Could not read the picture " + quoted(file.string()) + ": no such file.");
    return std::nullopt;
  }
  if (fs::is_directory(status)) {
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(file.string()) + ": not an image: it is a folder.");
    return std::nullopt;
  }
  try {
    return isTiff(file) ? decodeTiffFile(file, error) : decodeStbFile(file, error);
  } catch (const std::bad_alloc&) {
    // Frames decode on worker threads, where an escaping exception would end
    // the program: a picture too large for the memory left is a failed frame.
    fail(error, ImageSequenceErrorCode::NotAnImage,
         "Could not read the picture " + quoted(file.string()) + ": not enough memory.");
    return std::nullopt;
  }
}

bool readImageSize(const fs::path& file, int* width, int* height) {
  if (width == nullptr || height == nullptr) {
    return false;
  }
  if (isTiff(file)) {
    return readTiffSize(file, width, height);
  }
  int w = 0, h = 0, components = 0;
  if (stbi_info(file.c_str(), &w, &h, &components) == 0 || w <= 0 || h <= 0) {
    return false;
  }
  *width = w;
  *height = h;
  return true;
}

bool hasPictureExtension(const fs::path& file) {
  static constexpr std::array<std::string_view, 15> kExtensions{
      ".png", ".jpg", ".jpeg", ".tif", ".tiff", ".bmp", ".tga", ".gif",
      ".psd", ".hdr", ".pic",  ".pnm", ".ppm",  ".pgm", ".jpe"};
  const std::string extension = lowercase(file.extension().string());
  return std::find(kExtensions.begin(), kExtensions.end(), extension) != kExtensions.end();
}

bool naturalLess(std::string_view a, std::string_view b) {
  std::size_t i = 0, j = 0;
  while (i < a.size() && j < b.size()) {
    if (isDigit(a[i]) && isDigit(b[j])) {
      // Compare the runs as numbers: without leading zeros, the longer run
      // is the larger number, and equal lengths compare digit by digit.
      std::size_t endA = i, endB = j;
      while (endA < a.size() && isDigit(a[endA])) ++endA;
      while (endB < b.size() && isDigit(b[endB])) ++endB;
      std::size_t startA = i, startB = j;
      while (startA + 1 < endA && a[startA] == '0') ++startA;
      while (startB + 1 < endB && b[startB] == '0') ++startB;
      const std::string_view runA = a.substr(startA, endA - startA);
      const std::string_view runB = b.substr(startB, endB - startB);
      if (runA.size() != runB.size()) {
        return runA.size() < runB.size();
      }
      if (runA != runB) {
        return runA < runB;
      }
      i = endA;
      j = endB;
    } else if (a[i] != b[j]) {
      return static_cast<unsigned char>(a[i]) < static_cast<unsigned char>(b[j]);
    } else {
      ++i;
      ++j;
    }
  }
  if (i < a.size() || j < b.size()) {
    return j < b.size() && i == a.size();
  }
  return a < b;
}

// --- ImageSequence --------------------------------------------------------------

std::string ImageSequence::Pattern::format(int number) const {
  std::string digits = std::to_string(number);
  if (static_cast<int>(digits.size()) < width) {
    digits.insert(0, static_cast<std::size_t>(width) - digits.size(), pad);
  }
  return prefix + digits + suffix;
}

int ImageSequence::Pattern::parse(std::string_view name) const {
  if (name.size() <= prefix.size() + suffix.size() || !name.starts_with(prefix) ||
      !name.ends_with(suffix)) {
    return -1;
  }
  std::string_view field = name.substr(prefix.size(), name.size() - prefix.size() - suffix.size());
  std::size_t start = 0;
  while (start < field.size() && field[start] == pad) {
    ++start;
  }
  // "%04d" prints 0 as "0000": the padding then holds the number itself.
  if (start == field.size() && pad == '0') {
    start = field.size() - 1;
  }
  const std::string_view digits = field.substr(start);
  if (digits.empty() || digits.size() > kMaxNumberDigits ||
      !std::all_of(digits.begin(), digits.end(), isDigit)) {
    return -1;
  }
  int number = 0;
  for (char c : digits) {
    number = number * 10 + (c - '0');
  }
  // Only the exact text the pattern prints for the number counts.
  return format(number) == name ? number : -1;
}

std::optional<ImageSequence::Pattern> ImageSequence::parsePattern(const std::string& source,
                                                                  int* conversions) {
  Pattern pattern;
  std::string literal;
  bool malformed = false;
  *conversions = 0;
  for (std::size_t i = 0; i < source.size(); ++i) {
    if (source[i] != '%') {
      literal += source[i];
      continue;
    }
    if (i + 1 < source.size() && source[i + 1] == '%') {
      literal += '%';
      ++i;
      continue;
    }
    int width = 0;
    char pad = ' ';
    const std::size_t end = conversionEnd(source, i, &width, &pad);
    if (end == 0) {
      malformed = true;
      continue;
    }
    ++*conversions;
    pattern.prefix = std::move(literal);
    literal.clear();
    pattern.width = width;
    pattern.pad = pad;
    i = end - 1;
  }
  pattern.suffix = std::move(literal);
  if (malformed || *conversions != 1) {
    return std::nullopt;
  }
  return pattern;
}

bool ImageSequence::isPattern(const std::string& source) {
  int conversions = 0;
  return parsePattern(source, &conversions).has_value();
}

std::optional<ImageSequence> ImageSequence::resolvePattern(const std::string& source,
                                                           Error* error) {
  int conversions = 0;
  std::optional<Pattern> pattern = parsePattern(source, &conversions);
  if (!pattern) {
    fail(error, ImageSequenceErrorCode::BadPattern,
         "The frame pattern " + quoted(source) +
             " must hold exactly one integer conversion such as %04d (write a literal % as %%); "
             "it holds " +
             std::to_string(conversions) + ".");
    return std::nullopt;
  }
  if (pattern->suffix.find('/') != std::string::npos) {
    fail(error, ImageSequenceErrorCode::BadPattern,
         "The frame pattern " + quoted(source) +
             " numbers a folder; the number must be in the file name.");
    return std::nullopt;
  }
  ImageSequence sequence;
  const std::size_t slash = pattern->prefix.rfind('/');
  if (slash != std::string::npos) {
    sequence.folder_ = pattern->prefix.substr(0, slash + 1);
    pattern->prefix.erase(0, slash + 1);
  }
  int lowest = -1, highest = -1;
  std::error_code ec;
  const fs::path folder = sequence.folder_.empty() ? fs::path(".") : sequence.folder_;
  for (fs::directory_iterator it(folder, ec), end; !ec && it != end; it.increment(ec)) {
    const int number = pattern->parse(it->path().filename().string());
    if (number < 0) {
      continue;
    }
    std::error_code typeError;
    if (!it->is_regular_file(typeError)) {
      continue;
    }
    lowest = lowest < 0 ? number : std::min(lowest, number);
    highest = std::max(highest, number);
  }
  if (lowest < 0) {
    fail(error, ImageSequenceErrorCode::NoFrames,
         "No file matches the frame pattern " + quoted(source) + ".");
    return std::nullopt;
  }
  if (highest - lowest >= kMaxSequenceFrames) {
    fail(error, ImageSequenceErrorCode::TooManyFrames,
         "The frame pattern " + quoted(source) + " numbers its files from " +
             std::to_string(lowest) + " to " + std::to_string(highest) + ", more than " +
             std::to_string(kMaxSequenceFrames) + " frames.");
    return std::nullopt;
  }
  sequence.source_ = source;
  sequence.pattern_ = true;
  sequence.format_ = std::move(*pattern);
  sequence.firstNumber_ = lowest;
  sequence.numberCount_ = highest - lowest + 1;
  return sequence;
}

std::optional<ImageSequence> ImageSequence::resolveFolder(const std::string& source, Error* error) {
  std::vector<std::pair<std::string, fs::path>> pictures;
  std::error_code ec;
  for (fs::directory_iterator it(source, ec), end; !ec && it != end; it.increment(ec)) {
    std::string name = it->path().filename().string();
    std::error_code typeError;
    // Hidden files are the file system's or other tools' companions (such
    // as "._frame.png" resource forks), never frames.
    if (name.starts_with('.') || !hasPictureExtension(it->path()) ||
        !it->is_regular_file(typeError)) {
      continue;
    }
    if (pictures.size() >= static_cast<std::size_t>(kMaxSequenceFrames)) {
      fail(error, ImageSequenceErrorCode::TooManyFrames,
           "The folder " + quoted(source) + " holds more than " +
               std::to_string(kMaxSequenceFrames) + " pictures.");
      return std::nullopt;
    }
    pictures.emplace_back(std::move(name), it->path());
  }
  if (pictures.empty()) {
    fail(error, ImageSequenceErrorCode::NoFrames,
         ec ? "The folder " + quoted(source) + " cannot be read: " + ec.message() + "."
            : "The folder " + quoted(source) + " holds no picture files.");
    return std::nullopt;
  }
  std::sort(pictures.begin(), pictures.end(),
            [](const auto& a, const auto& b) { return naturalLess(a.first, b.first); });
  ImageSequence sequence;
  sequence.source_ = source;
  sequence.files_.reserve(pictures.size());
  for (auto& picture : pictures) {
    sequence.files_.push_back(std::move(picture.second));
  }
  return sequence;
}

std::optional<ImageSequence> ImageSequence::resolve(const std::string& source, Error* error) {
  if (source.empty()) {
    fail(error, ImageSequenceErrorCode::NoFrames, "No picture file or folder was named.");
    return std::nullopt;
  }
  if (isPattern(source)) {
    return resolvePattern(source, error);
  }
  std::error_code ec;
  const fs::file_status status = fs::status(source, ec);
  if (fs::is_directory(status)) {
    return resolveFolder(source, error);
  }
  if (fs::exists(status)) {
    ImageSequence sequence;
    sequence.source_ = source;
    sequence.files_.emplace_back(source);
    return sequence;
  }
  // Not a file: a '%' then means a pattern that is written wrongly.
  if (source.find('%') != std::string::npos) {
    return resolvePattern(source, error);
  }
  fail(error, ImageSequenceErrorCode::NoFrames,
       "The picture file or folder " + quoted(source) + " does not exist.");
  return std::nullopt;
}

int ImageSequence::frameCount() const {
  return pattern_ ? numberCount_ : static_cast<int>(files_.size());
}

fs::path ImageSequence::fileForFrame(int index) const {
  const int count = frameCount();
  // A sequence that was never resolved (moved from) has no file to give.
  if (count <= 0) {
    return {};
  }
  const int frame = std::clamp(index, 0, count - 1);
  if (!pattern_) {
    return files_[static_cast<std::size_t>(frame)];
  }
  return folder_ / format_.format(firstNumber_ + frame);
}

}  // namespace cloudreel
