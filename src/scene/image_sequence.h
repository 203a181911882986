#pragma once
// The pictures a card shows: reading one picture file into RGBA pixels, and
// resolving what the user named (one file, a folder of pictures, or a
// numbered file pattern) into the file of every frame. Decoding the frames
// ahead of playback, off the caller's thread, is ImageSequenceDecoder's job
// (scene/image_sequence_decoder.h).

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/error.h"

namespace cloudreel {

inline constexpr std::string_view kImageSequenceErrorDomain = "cloudreel.imageSequence";

enum class ImageSequenceErrorCode : int {
  // A file, folder or pattern that gives no frame.
  NoFrames = 1,
  // A source with '%' that is not a pattern of exactly one integer
  // conversion in its file name.
  BadPattern = 2,
  // More frames than kMaxSequenceFrames.
  TooManyFrames = 3,
  // A picture file that is not there.
  NoSuchFile = 4,
  // A file that is there but does not decode.
  NotAnImage = 5,
};

// The most frames one sequence resolves to, whether numbered or a folder's
// files: a bound on the memory of the resolved sequence and on the numbers
// it formats.
inline constexpr int kMaxSequenceFrames = 1'000'000;
// The largest picture decodeImageFile accepts, in pixels (1 GiB of RGBA): a
// corrupt header that claims a vast size is refused before anything is
// allocated for it.
inline constexpr std::int64_t kMaxImagePixels = std::int64_t{1} << 28;

// A decoded picture, RGBA 8 bits a sample, top row first.
struct DecodedImage {
  int width = 0;
  int height = 0;
  std::vector<std::uint8_t> pixels;

  std::size_t byteCount() const { return pixels.size(); }
};

// Reads a picture: TIFF (.tif/.tiff, any case) through libtiff, 8 or 16
// bits, 1 to 4 samples (grey, grey and alpha, RGB, RGBA) converted to
// RGBA8; everything else through stb_image (PNG, JPEG, BMP, TGA, GIF's first
// frame, PSD, HDR tone-mapped to 8 bits...). Grey becomes equal R, G and B;
// missing alpha becomes 255. Errors name the file and say why ("no such
// file", "not an image: ..."). Safe to call from several threads at once.
[[nodiscard]] std::optional<DecodedImage> decodeImageFile(const std::filesystem::path& file,
                                                          Error* error);
// Width and height from the file's header alone (no pixels decoded); false,
// leaving the outputs untouched, when the header cannot be read.
[[nodiscard]] bool readImageSize(const std::filesystem::path& file, int* width, int* height);

// Whether a file name has one of the picture extensions a folder source
// takes as frames (case-insensitive).
bool hasPictureExtension(const std::filesystem::path& file);
// Orders names as a person reads them: runs of digits compare as numbers,
// so "frame_2" comes before "frame_10". Equal numbers written with
// different leading zeros, and otherwise equal names, fall back to plain
// byte order so the order is total.
bool naturalLess(std::string_view a, std::string_view b);

// The files of a card: one picture, or a numbered sequence. Immutable once
// resolved, so several threads may read it at once.
class ImageSequence {
 public:
  // `source` is one of:
  //  - a folder: its picture files (by extension, case-insensitive; names
  //    starting with '.' are skipped) in naturalLess order; every file is a
  //    frame;
  //  - a printf-style pattern with one integer conversion in the file name
  //    (%d, %04d, %4d, and %i, %u alike; "%%" is a literal %), e.g.
  //    /renders/shot_%04d.png: the frames run from the smallest to the
  //    largest number whose file exists in that folder; numbers in between
  //    without a file are frames whose file is missing (they keep their
  //    place in time). A file counts only when its name is exactly what the
  //    pattern prints for its number, so shot_12.png does not match
  //    shot_%04d.png. Numbers are 0 to 999,999,999 (no sign);
  //  - anything else: one picture file (one frame), which must exist.
  // A source that gives no frame (missing file or folder, a folder without
  // pictures, a pattern nothing matches, a pattern with zero or two
  // conversions, or a range of more than kMaxSequenceFrames numbers) answers
  // nullopt with an error naming the source.
  [[nodiscard]] static std::optional<ImageSequence> resolve(const std::string& source,
                                                            Error* error);

  const std::string& source() const { return source_; }
  // At least 1 for a resolved sequence.
  int frameCount() const;
  // The file of frame `index`; an index outside 0..frameCount-1 is clamped
  // into it (a card holds its first picture before the sequence and its
  // last after it).
  std::filesystem::path fileForFrame(int index) const;
  // The number a pattern gives frame 0 (0 for other sources).
  int firstNumber() const { return pattern_ ? firstNumber_ : 0; }

  // Whether `source` is a pattern: exactly one integer conversion, every
  // other '%' written "%%".
  static bool isPattern(const std::string& source);

 private:
  // A pattern's file name split around its conversion, "%%" already
  // written as "%".
  struct Pattern {
    std::string prefix;
    std::string suffix;
    int width = 0;
    char pad = ' ';
    std::string format(int number) const;
    // The number `name` was printed from, or -1 when the pattern could not
    // have printed it.
    int parse(std::string_view name) const;
  };
  static std::optional<Pattern> parsePattern(const std::string& source, int* conversions);
  static std::optional<ImageSequence> resolvePattern(const std::string& source, Error* error);
  static std::optional<ImageSequence> resolveFolder(const std::string& source, Error* error);

  ImageSequence() = default;

  std::string source_;
  // A folder's files, or the one file.
  std::vector<std::filesystem::path> files_;
  bool pattern_ = false;
  Pattern format_;
  // The pattern's folder, as written (empty for the current folder).
  std::filesystem::path folder_;
  int firstNumber_ = 0;
  int numberCount_ = 0;
};

}  // namespace cloudreel
