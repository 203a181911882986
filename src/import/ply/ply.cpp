#include "import/ply/ply.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>
#include <system_error>

#include "import/ply/ply_reader.h"

namespace cloudreel {

using namespace ply_detail;

namespace {

void reportOnStandardError(p_ply, const char* message) {
  std::fprintf(stderr, "RPly: %s\n", message);
}

}  // namespace

std::string ply_detail::quoted(std::string_view text) {
  std::string out = "'";
  for (char c : text.substr(0, 40)) {
    out += (c >= ' ' && c <= '~') ? c : '?';
  }
  out += text.size() > 40 ? "...'" : "'";
  return out;
}

std::size_t PlyElement::fixedSize() const {
  std::size_t bytes = 0;
  for (const auto& property : properties) {
    bytes += kTypes[property->isList() ? property->lengthType : property->type].size;
  }
  return bytes;
}

bool PlyElement::hasList() const {
  return std::any_of(properties.begin(), properties.end(),
                     [](const auto& property) { return property->isList(); });
}

PlyReader::PlyReader(std::string fileName, p_ply_error_cb cb, long userIdata, void* userPdata)
    : name(std::move(fileName)),
      errorCb(cb ? cb : reportOnStandardError),
      idata(userIdata),
      pdata(userPdata) {}

PlyReader::~PlyReader() {
  if (fd >= 0) {
    ::close(fd);
  }
}

// --- Input -------------------------------------------------------------------

bool PlyReader::fail(const std::string& message) {
  if (!failed) {
    failed = true;
    std::string text = name + ": " + message;
    errorCb(this, text.c_str());
  }
  return false;
}

bool PlyReader::openFile() {
  fd = ::open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    return fail("cannot open the file: " + std::generic_category().message(errno));
  }
  struct stat info {};
  if (::fstat(fd, &info) == 0 && S_ISREG(info.st_mode)) {
    sizeKnown = true;
    size = static_cast<std::uint64_t>(info.st_size);
    ::posix_fadvise(fd, 0, 0, POSIX_FADV_SEQUENTIAL);
  }
  capacity = kBlockSize;
  storage = std::make_unique_for_overwrite<char[]>(capacity);
  pos = end = storage.get();
  return true;
}

void PlyReader::openMemory(const void* data, std::size_t bytes) {
  sizeKnown = true;
  size = bytes;
  delivered = bytes;
  eof = true;
  pos = static_cast<const char*>(data);
  end = pos + bytes;
}

bool PlyReader::fill(std::size_t n) {
  std::size_t have = available();
  if (have >= n) {
    return true;
  }
  if (eof || failed) {
    return false;
  }
  if (capacity < n) {
    std::size_t grown = std::max(n, capacity * 2);
    auto bigger = std::make_unique_for_overwrite<char[]>(grown);
    std::memcpy(bigger.get(), pos, have);
    storage = std::move(bigger);
    capacity = grown;
  } else if (have > 0) {
    std::memmove(storage.get(), pos, have);
  }
  pos = storage.get();
  end = pos + have;
  while (have < n) {
    ssize_t got = ::read(fd, storage.get() + have, capacity - have);
    if (got < 0 && errno == EINTR) {
      continue;
    }
    if (got < 0) {
      return fail("reading failed: " + std::generic_category().message(errno));
    }
    if (got == 0) {
      eof = true;
      break;
    }
    have += static_cast<std::size_t>(got);
    delivered += static_cast<std::uint64_t>(got);
    end = pos + have;
  }
  return have >= n;
}

bool PlyReader::skip(std::uint64_t n) {
  std::size_t have = available();
  if (n <= have) {
    pos += n;
    return true;
  }
  n -= have;
  pos = end;
  if (eof || failed) {
    return false;
  }
  if (sizeKnown) {
    if (n > size - std::min(size, delivered)) {
      return false;
    }
    delivered += n;
    return ::lseek(fd, static_cast<off_t>(delivered), SEEK_SET) >= 0 ||
           fail("seeking failed: " + std::generic_category().message(errno));
  }
  while (n > 0) {
    if (!fill(1)) {
      return false;
    }
    std::size_t step = static_cast<std::size_t>(std::min<std::uint64_t>(n, available()));
    pos += step;
    n -= step;
  }
  return true;
}

namespace {

const char* nextText(const std::string& texts, const char* last) {
  if (last == nullptr) {
    return texts.empty() ? nullptr : texts.c_str();
  }
  const char* next = last + std::strlen(last) + 1;
  return next < texts.c_str() + texts.size() ? next : nullptr;
}

}  // namespace

p_ply ply_open(const char* name, p_ply_error_cb error_cb, long idata, void* pdata) {
  auto reader = std::make_unique<PlyReader>(name ? name : "", error_cb, idata, pdata);
  if (!reader->openFile()) {
    return nullptr;
  }
  return reader.release();
}

p_ply ply_open_from_memory(const void* data, std::size_t size, const char* name,
                           p_ply_error_cb error_cb, long idata, void* pdata) {
  auto reader = std::make_unique<PlyReader>(name ? name : "", error_cb, idata, pdata);
  reader->openMemory(size > 0 ? data : "", size);
  return reader.release();
}

int ply_read_header(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  if (ply->state != PlyReader::State::Opened || ply->failed) {
    return ply->fail("the header can be read only once, right after opening");
  }
  ply->state = PlyReader::State::HeaderRead;
  return ply->readHeader() ? 1 : 0;
}

long ply_set_read_cb(p_ply ply, const char* element_name, const char* property_name,
                     p_ply_read_cb read_cb, void* pdata, long idata) {
  if (ply == nullptr || element_name == nullptr || property_name == nullptr) {
    return 0;
  }
  for (const auto& element : ply->elements) {
    if (element->name != element_name) {
      continue;
    }
    for (const auto& property : element->properties) {
      if (property->name == property_name) {
        property->readCb = read_cb;
        property->pdata = pdata;
        property->idata = idata;
        return element->ninstances;
      }
    }
    return 0;
  }
  return 0;
}

long ply_set_block_cb(p_ply ply, const char* element_name, p_ply_block_cb block_cb, void* pdata) {
  if (ply == nullptr || element_name == nullptr || ply->mode == PLY_ASCII) {
    return 0;
  }
  for (const auto& element : ply->elements) {
    if (element->name == element_name) {
      if (element->hasList()) {
        return 0;
      }
      element->blockCb = block_cb;
      element->blockPdata = pdata;
      return element->ninstances;
    }
  }
  return 0;
}

int ply_read(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  if (ply->state != PlyReader::State::HeaderRead || ply->failed) {
    return ply->fail("the data can be read only once, after the header");
  }
  ply->state = PlyReader::State::Read;
  return ply->readData() ? 1 : 0;
}

int ply_close(p_ply ply) {
  if (ply == nullptr) {
    return 0;
  }
  delete ply;
  return 1;
}

p_ply_element ply_get_next_element(p_ply ply, p_ply_element last) {
  if (ply == nullptr) {
    return nullptr;
  }
  std::size_t next = last == nullptr ? 0 : last->index + 1;
  if ((last != nullptr && last->reader != ply) || next >= ply->elements.size()) {
    return nullptr;
  }
  return ply->elements[next].get();
}

int ply_get_element_info(p_ply_element element, const char** name, long* ninstances) {
  if (element == nullptr) {
    return 0;
  }
  if (name) {
    *name = element->name.c_str();
  }
  if (ninstances) {
    *ninstances = element->ninstances;
  }
  return 1;
}

p_ply_property ply_get_next_property(p_ply_element element, p_ply_property last) {
  if (element == nullptr) {
    return nullptr;
  }
  std::size_t next = last == nullptr ? 0 : last->index + 1;
  if ((last != nullptr && last->element != element) || next >= element->properties.size()) {
    return nullptr;
  }
  return element->properties[next].get();
}

int ply_get_property_info(p_ply_property property, const char** name, e_ply_type* type,
                          e_ply_type* length_type, e_ply_type* value_type) {
  if (property == nullptr) {
    return 0;
  }
  if (name) {
    *name = property->name.c_str();
  }
  if (type) {
    *type = property->type;
  }
  if (length_type) {
    *length_type = property->lengthType;
  }
  if (value_type) {
    *value_type = property->valueType;
  }
  return 1;
}

const char* ply_get_next_comment(p_ply ply, const char* last) {
  return ply ? nextText(ply->comments, last) : nullptr;
}

const char* ply_get_next_obj_info(p_ply ply, const char* last) {
  return ply ? nextText(ply->objInfos, last) : nullptr;
}

e_ply_storage_mode ply_get_storage_mode(p_ply ply) { return ply ? ply->mode : PLY_ASCII; }

const char* ply_storage_mode_name(e_ply_storage_mode mode) {
  switch (mode) {
    case PLY_BIG_ENDIAN:
      return "binary_big_endian";
    case PLY_LITTLE_ENDIAN:
      return "binary_little_endian";
    case PLY_ASCII:
      return "ascii";
  }
  return "";
}

const char* ply_type_name(e_ply_type type) {
  if (type >= 0 && type < kScalarTypeCount) {
    return kTypes[type].name;
  }
  return type == PLY_LIST ? "list" : "";
}

std::size_t ply_type_size(e_ply_type type) {
  return type >= 0 && type < kScalarTypeCount ? kTypes[type].size : 0;
}

int ply_get_ply_user_data(p_ply ply, void** pdata, long* idata) {
  if (ply == nullptr) {
    return 0;
  }
  if (pdata) {
    *pdata = ply->pdata;
  }
  if (idata) {
    *idata = ply->idata;
  }
  return 1;
}

}  // namespace cloudreel
