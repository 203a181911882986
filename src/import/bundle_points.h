#pragma once
// Reads the points section of a bundle file into point records. Each point
// is a position line "x y z", a colour line "r g b" and a view list, which
// is skipped; the numbers are read as fields by the text scanner's rules,
// so a damaged section is read exactly as the scanner reads it.
//
// A large section is read on every core: the text is taken a block at a
// time, each block is cut at point boundaries found by counting its lines
// (a point takes three), and each core parses one part into the records its
// points go to. A part is kept only when the part before it ended exactly
// where it begins; otherwise (a damaged file whose points do not take three
// lines) the reading goes on from where the earlier part really ended. So
// the records, their count and the bounding box are those of a reading on
// one thread, whatever the file holds. A point longer than a block (a very
// long view list) is read with the scanner from the stream, so memory stays
// at one block however long a line is.

#include <cstddef>
#include <cstdint>
#include <optional>

#include "scene/layer.h"

namespace cloudreel {

class InputStream;

struct BundlePointReading {
  // The threads that parse: 0 for one per core. With one, or for a section
  // no longer than a block, the scanner reads the points on the calling
  // thread, which is the reading the parallel one must equal.
  unsigned threads = 0;
  // The bytes of text held at a time (at least 2); 0 for 128 KiB a
  // thread, at most 2 MiB, which keeps the memory beside the points small
  // (256 KiB on two cores) while a part still holds a thousand points or
  // so, enough to make the two wake-ups of its thread a block cheap.
  std::size_t blockBytes = 0;
};

struct BundlePoints {
  std::int32_t count = 0;
  // The box of the points read (minimum x, y, z, then maximum x, y, z);
  // none when no point was read.
  std::optional<Layer::BoundingBox> box;
};

// Reads up to `capacity` points from `in` at its position, point i into
// the record at `records + i * stride` (a record of at least 16 bytes:
// three floats of position first, the red, green, blue and luck bytes
// last). Colours keep their low eight bits (300 is 44, -1 is 255) and the
// luck of point i is i modulo 256. A point cut short by the end of the
// text reads 0 for what it lacks; reading stops at `capacity` points or
// when only white space is left. The records must be zero to begin with;
// those past the count are left zero.
BundlePoints readBundlePoints(InputStream& in, std::uint8_t* records, std::size_t stride,
                              std::int32_t capacity, const BundlePointReading& reading = {});

}  // namespace cloudreel
