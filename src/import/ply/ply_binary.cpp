// The binary encodings of PLY data: instances of one fixed size read a run
// at a time (or handed over whole, a block at a time), instances with lists
// value by value; either byte order.

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "import/ply/ply_reader.h"

namespace cloudreel {

using namespace ply_detail;

namespace {

template <typename U, bool kSwap>
U load(const char* p) {
  U v;
  std::memcpy(&v, p, sizeof v);
  if constexpr (kSwap && sizeof(U) > 1) {
    if constexpr (sizeof(U) == 2) {
      v = __builtin_bswap16(v);
    } else if constexpr (sizeof(U) == 4) {
      v = __builtin_bswap32(v);
    } else {
      v = __builtin_bswap64(v);
    }
  }
  return v;
}

// One binary value; kSwap when the file's byte order is not the machine's.
template <bool kSwap>
inline double decode(const char* p, Scalar s) {
  switch (s) {
    case Scalar::I8:
      return static_cast<std::int8_t>(*p);
    case Scalar::U8:
      return static_cast<unsigned char>(*p);
    case Scalar::I16:
      return static_cast<std::int16_t>(load<std::uint16_t, kSwap>(p));
    case Scalar::U16:
      return load<std::uint16_t, kSwap>(p);
    case Scalar::I32:
      return static_cast<std::int32_t>(load<std::uint32_t, kSwap>(p));
    case Scalar::U32:
      return load<std::uint32_t, kSwap>(p);
    case Scalar::F32:
      return std::bit_cast<float>(load<std::uint32_t, kSwap>(p));
    case Scalar::F64:
      return std::bit_cast<double>(load<std::uint64_t, kSwap>(p));
  }
  return 0.0;
}

// The same property of `count` consecutive instances `size` bytes apart,
// into out[0], out[stride], ...
template <typename T, typename U, bool kSwap>
void decodeRunAs(const char* p, std::size_t size, long count, double* out, std::size_t stride) {
  for (long i = 0; i < count; ++i, p += size, out += stride) {
    *out = std::bit_cast<T>(load<U, kSwap>(p));
  }
}

template <bool kSwap>
void decodeRun(const char* p, std::size_t size, long count, Scalar s, double* out,
               std::size_t stride) {
  switch (s) {
    case Scalar::I8:
      return decodeRunAs<std::int8_t, std::uint8_t, kSwap>(p, size, count, out, stride);
    case Scalar::U8:
      return decodeRunAs<std::uint8_t, std::uint8_t, kSwap>(p, size, count, out, stride);
    case Scalar::I16:
      return decodeRunAs<std::int16_t, std::uint16_t, kSwap>(p, size, count, out, stride);
    case Scalar::U16:
      return decodeRunAs<std::uint16_t, std::uint16_t, kSwap>(p, size, count, out, stride);
    case Scalar::I32:
      return decodeRunAs<std::int32_t, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::U32:
      return decodeRunAs<std::uint32_t, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::F32:
      return decodeRunAs<float, std::uint32_t, kSwap>(p, size, count, out, stride);
    case Scalar::F64:
      return decodeRunAs<double, std::uint64_t, kSwap>(p, size, count, out, stride);
  }
}

}  // namespace

bool PlyReader::truncated(const PlyElement& element, const PlyProperty* property, long index) {
  std::string where = "element " + quoted(element.name);
  if (property) {
    where += ", property " + quoted(property->name);
  }
  if (index >= 0) {
    where +=
        " (instance " + std::to_string(index) + " of " + std::to_string(element.ninstances) + ")";
  }
  return fail("the file ends inside " + where);
}

bool PlyReader::aborted(const PlyArgument& argument) {
  return fail("reading stopped by the callback of element " + quoted(argument.element_->name) +
              ", property " + quoted(argument.property_->name) + " (instance " +
              std::to_string(argument.instanceIndex_) + ")");
}

bool PlyReader::readData() {
  bool swap = (mode == PLY_BIG_ENDIAN) != (std::endian::native == std::endian::big);
  for (const auto& owned : elements) {
    PlyElement& element = *owned;
    if (element.ninstances == 0 || element.properties.empty()) {
      continue;
    }
    bool ok = true;
    if (mode == PLY_ASCII) {
      ok = readAscii(element);
    } else {
      bool hasList = false;
      bool hasCallback = false;
      std::uint64_t instanceSize = 0;
      for (const auto& property : element.properties) {
        hasList |= property->isList();
        hasCallback |= property->readCb != nullptr;
        instanceSize += kTypes[property->isList() ? property->lengthType : property->type].size;
      }
      if (!hasList && element.blockCb != nullptr) {
        ok = readBlocks(element, instanceSize);
      } else if (!hasList && !hasCallback) {
        std::uint64_t bytes =
            saturatingMul(instanceSize, static_cast<std::uint64_t>(element.ninstances));
        ok = skip(bytes) || truncated(element, nullptr, -1);
      } else if (!hasList) {
        ok =
            swap ? readFixed<true>(element, instanceSize) : readFixed<false>(element, instanceSize);
      } else {
        ok = swap ? readBinary<true>(element) : readBinary<false>(element);
      }
    }
    if (!ok) {
      return false;
    }
  }
  return true;
}

// Instances of one size, read a run at a time straight from the buffer:
// each property with a callback is first decoded for the whole run (one
// type dispatch per run, not per value), then the callbacks are called in
// file order. Properties without a callback are never touched. Each
// property keeps its own argument, filled once, so a call costs only the
// stores of the instance index and the value.
template <bool kSwap>
bool PlyReader::readFixed(PlyElement& element, std::size_t instanceSize) {
  struct Step {
    std::size_t offset;
    Scalar scalar;
    p_ply_read_cb readCb;
    PlyArgument argument;
  };
  std::vector<Step> steps;
  std::size_t offset = 0;
  for (const auto& property : element.properties) {
    if (property->readCb) {
      Step& step = steps.emplace_back();
      step.offset = offset;
      step.scalar = kTypes[property->type].scalar;
      step.readCb = property->readCb;
      step.argument.element_ = &element;
      step.argument.property_ = property.get();
      step.argument.pdata_ = property->pdata;
      step.argument.idata_ = property->idata;
    }
    offset += kTypes[property->type].size;
  }
  // Small enough for the decoded values to stay in the first-level cache.
  constexpr long kRun = 256;
  const std::size_t stride = steps.size();
  std::vector<double> values(static_cast<std::size_t>(kRun) * stride);
  long index = 0;
  while (index < element.ninstances) {
    if (!fill(instanceSize)) {
      return truncated(element, nullptr, index);
    }
    long run =
        std::min({element.ninstances - index, kRun, static_cast<long>(available() / instanceSize)});
    for (std::size_t s = 0; s < stride; ++s) {
      decodeRun<kSwap>(pos + steps[s].offset, instanceSize, run, steps[s].scalar, values.data() + s,
                       stride);
    }
    const double* value = values.data();
    for (long i = 0; i < run; ++i) {
      for (Step& step : steps) {
        step.argument.instanceIndex_ = index + i;
        step.argument.value_ = *value++;
        if (!step.readCb(&step.argument)) {
          return aborted(step.argument);
        }
      }
    }
    pos += static_cast<std::size_t>(run) * instanceSize;
    index += run;
  }
  return true;
}

// Instances of one size handed over whole, as many as the buffer holds at
// a time. The instance a file ends inside is reported as readFixed reports
// it, so a caller sees the same failure whichever way it reads.
bool PlyReader::readBlocks(PlyElement& element, std::size_t instanceSize) {
  long index = 0;
  while (index < element.ninstances) {
    if (!fill(instanceSize)) {
      return truncated(element, nullptr, index);
    }
    const long run =
        std::min(element.ninstances - index, static_cast<long>(available() / instanceSize));
    if (!element.blockCb(pos, index, run, element.blockPdata)) {
      return fail("reading stopped by the block callback of element " + quoted(element.name) +
                  " (instances " + std::to_string(index) + " to " +
                  std::to_string(index + run - 1) + ")");
    }
    pos += static_cast<std::size_t>(run) * instanceSize;
    index += run;
  }
  return true;
}

// Instances with lists: property by property.
template <bool kSwap>
bool PlyReader::readBinary(PlyElement& element) {
  PlyArgument argument;
  argument.element_ = &element;
  for (long index = 0; index < element.ninstances; ++index) {
    argument.instanceIndex_ = index;
    for (const auto& owned : element.properties) {
      PlyProperty& property = *owned;
      argument.property_ = &property;
      argument.pdata_ = property.pdata;
      argument.idata_ = property.idata;
      const TypeInfo& type = kTypes[property.isList() ? property.lengthType : property.type];
      if (!fill(type.size)) {
        return truncated(element, &property, index);
      }
      double value = decode<kSwap>(pos, type.scalar);
      pos += type.size;
      if (!property.isList()) {
        if (property.readCb) {
          argument.length_ = 1;
          argument.valueIndex_ = 0;
          argument.value_ = value;
          if (!property.readCb(&argument)) {
            return aborted(argument);
          }
        }
        continue;
      }
      if (value < 0) {
        return fail("negative list length in element " + quoted(element.name) + ", property " +
                    quoted(property.name) + " (instance " + std::to_string(index) + ")");
      }
      // At most 2^32 - 1: the length type is an integer of 32 bits or less.
      long length = static_cast<long>(value);
      const TypeInfo& item = kTypes[property.valueType];
      if (!property.readCb) {
        if (!skip(static_cast<std::uint64_t>(length) * item.size)) {
          return truncated(element, &property, index);
        }
        continue;
      }
      argument.length_ = length;
      argument.valueIndex_ = -1;
      argument.value_ = value;
      if (!property.readCb(&argument)) {
        return aborted(argument);
      }
      for (long i = 0; i < length; ++i) {
        if (!fill(item.size)) {
          return truncated(element, &property, index);
        }
        argument.valueIndex_ = i;
        argument.value_ = decode<kSwap>(pos, item.scalar);
        pos += item.size;
        if (!property.readCb(&argument)) {
          return aborted(argument);
        }
      }
    }
  }
  return true;
}
}  // namespace cloudreel
