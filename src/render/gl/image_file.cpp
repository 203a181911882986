#include "render/gl/image_file.h"

#include "platform/atomic_file.h"

#include <tiffio.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <limits>
#include <string>

namespace cloudreel::gl {
namespace {

// Classic TIFF addresses its file with 32-bit offsets; leave room for the
// directory after the pixels.
constexpr std::uint64_t kMaxTiffPixelBytes = std::uint64_t{0xFFFFFFFF} - (1u << 20);
// A corrupt header must not make the reader allocate without bound.
constexpr std::uint64_t kMaxDecodedSamples = std::uint64_t{1} << 30;

bool fail(Error* error, ImageErrorCode code, std::string message) {
  setError(error, std::string(kImageErrorDomain), static_cast<int>(code), std::move(message));
  return false;
}

// libtiff reads and writes through these, over a byte vector (writing) or a
// byte span (reading).
struct MemoryStream {
  std::vector<std::uint8_t>* output = nullptr;
  std::span<const std::uint8_t> input;
  std::uint64_t position = 0;

  std::uint64_t size() const { return output != nullptr ? output->size() : input.size(); }
};

tmsize_t streamRead(thandle_t handle, void* buffer, tmsize_t count) {
  auto* stream = static_cast<MemoryStream*>(handle);
  const std::uint64_t size = stream->size();
  if (count <= 0 || stream->position >= size) {
    return 0;
  }
  const std::uint64_t n = std::min<std::uint64_t>(static_cast<std::uint64_t>(count), size - stream->position);
  const std::uint8_t* source =
      stream->output != nullptr ? stream->output->data() : stream->input.data();
  std::memcpy(buffer, source + stream->position, n);
  stream->position += n;
  return static_cast<tmsize_t>(n);
}

tmsize_t streamWrite(thandle_t handle, void* buffer, tmsize_t count) {
  auto* stream = static_cast<MemoryStream*>(handle);
  if (stream->output == nullptr || count < 0) {
    return -1;
  }
  const std::uint64_t end = stream->position + static_cast<std::uint64_t>(count);
  if (end > stream->output->size()) {
    stream->output->resize(end);
  }
  std::memcpy(stream->output->data() + stream->position, buffer, static_cast<std::size_t>(count));
  stream->position = end;
  return count;
}

toff_t streamSeek(thandle_t handle, toff_t offset, int whence) {
  auto* stream = static_cast<MemoryStream*>(handle);
  std::uint64_t base = 0;
  if (whence == SEEK_CUR) {
    base = stream->position;
  } else if (whence == SEEK_END) {
    base = stream->size();
  }
  // libtiff passes negative relative offsets as wrapped unsigned values, so
  // the unsigned sum wraps to the intended position.
  stream->position = base + offset;
  return stream->position;
}

int streamClose(thandle_t) { return 0; }
toff_t streamSize(thandle_t handle) { return static_cast<MemoryStream*>(handle)->size(); }
int streamMap(thandle_t, void**, toff_t*) { return 0; }
void streamUnmap(thandle_t, void*, toff_t) {}

int captureMessage(TIFF*, void* userData, const char* module, const char* format, va_list args) {
  char text[512];
  std::vsnprintf(text, sizeof text, format, args);
  auto* message = static_cast<std::string*>(userData);
  if (message->empty()) {
    *message = module != nullptr && *module != '\0' ? std::string(module) + ": " + text : text;
  }
  return 1;
}

int ignoreMessage(TIFF*, void*, const char*, const char*, va_list) { return 1; }

// An open libtiff handle over a memory stream, with its messages collected
// instead of printed.
class TiffHandle {
 public:
  TiffHandle(MemoryStream& stream, const char* mode) {
    TIFFOpenOptions* options = TIFFOpenOptionsAlloc();
    TIFFOpenOptionsSetErrorHandlerExtR(options, captureMessage, &message_);
    TIFFOpenOptionsSetWarningHandlerExtR(options, ignoreMessage, nullptr);
    tiff_ = TIFFClientOpenExt("memory", mode, &stream, streamRead, streamWrite, streamSeek,
                              streamClose, streamSize, streamMap, streamUnmap, options);
    TIFFOpenOptionsFree(options);
  }
  ~TiffHandle() { close(); }
  TiffHandle(const TiffHandle&) = delete;
  TiffHandle& operator=(const TiffHandle&) = delete;

  TIFF* get() const { return tiff_; }
  void close() {
    if (tiff_ != nullptr) {
      TIFFClose(tiff_);
      tiff_ = nullptr;
    }
  }
  std::string message() const { return message_.empty() ? "libtiff failed" : message_; }

 private:
  TIFF* tiff_ = nullptr;
  // Filled by libtiff's error handler, which holds a pointer to it.
  std::string message_;
};

struct Layout {
  std::uint16_t bitsPerSample;
  std::uint16_t samplesPerPixel;
  std::uint16_t photometric;
};

// Writes the tags, then each row through `fillRow(row, buffer)`.
template <typename FillRow>
bool encode(int width, int height, Layout layout, std::vector<std::uint8_t>& out, Error* error,
            FillRow fillRow) {
  out.clear();
  if (width <= 0 || height <= 0) {
    return fail(error, ImageErrorCode::InvalidImage,
                "Cannot write an empty " + std::to_string(width) + "×" + std::to_string(height) +
                    " image.");
  }
  const std::uint64_t rowBytes = static_cast<std::uint64_t>(width) * layout.samplesPerPixel *
                                 (layout.bitsPerSample / 8);
  if (rowBytes * static_cast<std::uint64_t>(height) > kMaxTiffPixelBytes) {
    return fail(error, ImageErrorCode::InvalidImage,
                "A " + std::to_string(width) + "×" + std::to_string(height) +
                    " image is too large for a TIFF file.");
  }
  out.reserve(static_cast<std::size_t>(rowBytes * static_cast<std::uint64_t>(height)) + 1024);
  MemoryStream stream;
  stream.output = &out;
  TiffHandle tiff(stream, "w");
  if (tiff.get() == nullptr) {
    return fail(error, ImageErrorCode::WriteFailed, tiff.message());
  }
  TIFF* t = tiff.get();
  TIFFSetField(t, TIFFTAG_IMAGEWIDTH, static_cast<std::uint32_t>(width));
  TIFFSetField(t, TIFFTAG_IMAGELENGTH, static_cast<std::uint32_t>(height));
  TIFFSetField(t, TIFFTAG_BITSPERSAMPLE, layout.bitsPerSample);
  TIFFSetField(t, TIFFTAG_SAMPLESPERPIXEL, layout.samplesPerPixel);
  TIFFSetField(t, TIFFTAG_PHOTOMETRIC, layout.photometric);
  TIFFSetField(t, TIFFTAG_SAMPLEFORMAT, static_cast<std::uint16_t>(SAMPLEFORMAT_UINT));
  TIFFSetField(t, TIFFTAG_PLANARCONFIG, static_cast<std::uint16_t>(PLANARCONFIG_CONTIG));
  TIFFSetField(t, TIFFTAG_ORIENTATION, static_cast<std::uint16_t>(ORIENTATION_TOPLEFT));
  TIFFSetField(t, TIFFTAG_COMPRESSION, static_cast<std::uint16_t>(COMPRESSION_NONE));
  TIFFSetField(t, TIFFTAG_ROWSPERSTRIP, TIFFDefaultStripSize(t, 0));
  TIFFSetField(t, TIFFTAG_SOFTWARE, "Cloudreel");
  std::vector<std::uint8_t> row(static_cast<std::size_t>(rowBytes));
  for (int y = 0; y < height; ++y) {
    fillRow(y, row.data());
    if (TIFFWriteScanline(t, row.data(), static_cast<std::uint32_t>(y), 0) < 0) {
      return fail(error, ImageErrorCode::WriteFailed, tiff.message());
    }
  }
  if (TIFFWriteDirectory(t) == 0) {
    return fail(error, ImageErrorCode::WriteFailed, tiff.message());
  }
  tiff.close();
  return true;
}

bool withFileName(bool ok, const std::filesystem::path& path, std::string_view verb, Error* error) {
  if (!ok && error != nullptr) {
    error->message = "Could not " + std::string(verb) + " the TIFF file “" + path.string() +
                     "”: " + error->message;
  }
  return ok;
}

// Frames replace their file atomically, so a reader never sees half a
// frame; they are not flushed to the disk one by one.
bool writeFrameFile(const std::filesystem::path& path, std::span<const std::uint8_t> bytes,
                    Error* error) {
  Error fileError;
  if (writeFileAtomically(path, bytes, &fileError, Durability::Unsynced)) {
    return true;
  }
  return fail(error, ImageErrorCode::WriteFailed, fileError.message);
}

}  // namespace

bool encodeColorTiff(const RgbaImage& image, std::vector<std::uint8_t>& out, Error* error) {
  if (!image.isConsistent()) {
    out.clear();
    return fail(error, ImageErrorCode::InvalidImage,
                "The colour image's pixels do not match its size.");
  }
  const std::size_t width = static_cast<std::size_t>(image.width);
  return encode(image.width, image.height, Layout{8, 3, PHOTOMETRIC_RGB}, out, error,
                [&](int y, std::uint8_t* row) {
                  const std::uint8_t* source = image.pixels.data() + static_cast<std::size_t>(y) * image.rowBytes();
                  for (std::size_t x = 0; x < width; ++x) {
                    row[3 * x] = source[4 * x];
                    row[3 * x + 1] = source[4 * x + 1];
                    row[3 * x + 2] = source[4 * x + 2];
                  }
                });
}

bool encodeDepthTiff(const DepthImage& image, std::vector<std::uint8_t>& out, Error* error) {
  if (!image.isConsistent()) {
    out.clear();
    return fail(error, ImageErrorCode::InvalidImage,
                "The depth image's values do not match its size.");
  }
  const std::size_t width = static_cast<std::size_t>(image.width);
  // libtiff takes 16-bit samples in native byte order and records that
  // order in the header.
  return encode(image.width, image.height, Layout{16, 1, PHOTOMETRIC_MINISBLACK}, out, error,
                [&](int y, std::uint8_t* row) {
                  std::memcpy(row, image.values.data() + static_cast<std::size_t>(y) * width,
                              width * sizeof(std::uint16_t));
                });
}

bool writeColorTiff(const std::filesystem::path& path, const RgbaImage& image, Error* error) {
  std::vector<std::uint8_t> bytes;
  return withFileName(encodeColorTiff(image, bytes, error), path, "write", error) &&
         writeFrameFile(path, bytes, error);
}

bool writeDepthTiff(const std::filesystem::path& path, const DepthImage& image, Error* error) {
  std::vector<std::uint8_t> bytes;
  return withFileName(encodeDepthTiff(image, bytes, error), path, "write", error) &&
         writeFrameFile(path, bytes, error);
}

std::optional<TiffImage> decodeTiff(std::span<const std::uint8_t> bytes, Error* error) {
  MemoryStream stream;
  stream.input = bytes;
  TiffHandle tiff(stream, "r");
  if (tiff.get() == nullptr) {
    fail(error, ImageErrorCode::ReadFailed, "Not a TIFF file (" + tiff.message() + ").");
    return std::nullopt;
  }
  TIFF* t = tiff.get();
  std::uint32_t width = 0;
  std::uint32_t height = 0;
  std::uint16_t bits = 0;
  std::uint16_t samples = 0;
  std::uint16_t planar = 0;
  std::uint16_t photometric = 0;
  std::uint16_t orientation = 0;
  if (TIFFGetField(t, TIFFTAG_IMAGEWIDTH, &width) != 1 ||
      TIFFGetField(t, TIFFTAG_IMAGELENGTH, &height) != 1 ||
      TIFFGetField(t, TIFFTAG_PHOTOMETRIC, &photometric) != 1) {
    fail(error, ImageErrorCode::ReadFailed, "The TIFF file lacks its dimensions or photometric tag.");
    return std::nullopt;
  }
  TIFFGetFieldDefaulted(t, TIFFTAG_BITSPERSAMPLE, &bits);
  TIFFGetFieldDefaulted(t, TIFFTAG_SAMPLESPERPIXEL, &samples);
  TIFFGetFieldDefaulted(t, TIFFTAG_PLANARCONFIG, &planar);
  TIFFGetFieldDefaulted(t, TIFFTAG_ORIENTATION, &orientation);
  if (TIFFIsTiled(t) || planar != PLANARCONFIG_CONTIG || (bits != 8 && bits != 16) ||
      samples < 1 || samples > 4) {
    fail(error, ImageErrorCode::Unsupported,
         "Only strip-organised, interleaved TIFF files with 1 to 4 samples of 8 or 16 bits are read.");
    return std::nullopt;
  }
  const std::uint64_t total = std::uint64_t{width} * height * samples;
  if (width == 0 || height == 0 || total > kMaxDecodedSamples) {
    fail(error, ImageErrorCode::Unsupported,
         "The TIFF file's size " + std::to_string(width) + "×" + std::to_string(height) +
             " is empty or too large.");
    return std::nullopt;
  }
  const std::size_t rowSamples = std::size_t{width} * samples;
  const std::size_t rowBytes = rowSamples * (bits / 8);
  if (static_cast<std::uint64_t>(TIFFScanlineSize64(t)) != rowBytes) {
    fail(error, ImageErrorCode::ReadFailed, "The TIFF file's row size is inconsistent.");
    return std::nullopt;
  }
  TiffImage image;
  image.width = static_cast<int>(width);
  image.height = static_cast<int>(height);
  image.samplesPerPixel = samples;
  image.bitsPerSample = bits;
  image.photometric = photometric;
  image.orientation = orientation;
  image.samples.resize(static_cast<std::size_t>(total));
  std::vector<std::uint8_t> row(rowBytes);
  for (std::uint32_t y = 0; y < height; ++y) {
    if (TIFFReadScanline(t, row.data(), y, 0) < 0) {
      fail(error, ImageErrorCode::ReadFailed, "Row " + std::to_string(y) + ": " + tiff.message());
      return std::nullopt;
    }
    std::uint16_t* target = image.samples.data() + std::size_t{y} * rowSamples;
    if (bits == 8) {
      std::copy(row.begin(), row.end(), target);
    } else {
      // libtiff has already swapped 16-bit samples into native order.
      std::memcpy(target, row.data(), rowBytes);
    }
  }
  return image;
}

std::optional<TiffImage> readTiff(const std::filesystem::path& path, Error* error) {
  std::FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) {
    fail(error, ImageErrorCode::ReadFailed,
         "Could not read the TIFF file “" + path.string() + "”: " + std::strerror(errno) + ".");
    return std::nullopt;
  }
  std::vector<std::uint8_t> bytes;
  std::uint8_t buffer[1 << 16];
  std::size_t n = 0;
  while ((n = std::fread(buffer, 1, sizeof buffer, file)) > 0) {
    bytes.insert(bytes.end(), buffer, buffer + n);
  }
  const bool readError = std::ferror(file) != 0;
  std::fclose(file);
  if (readError) {
    fail(error, ImageErrorCode::ReadFailed,
         "Could not read the TIFF file “" + path.string() + "”: read error.");
    return std::nullopt;
  }
  auto image = decodeTiff(bytes, error);
  if (!image && error != nullptr) {
    error->message = "Could not read the TIFF file “" + path.string() + "”: " + error->message;
  }
  return image;
}

}  // namespace cloudreel::gl
