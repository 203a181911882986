// Feeds arbitrary bytes to the PLY reader twice, as a file held in memory
// and as a file read through its descriptor: reads the header, walks every
// element, property, comment and obj_info, asks for every property of every
// element and reads the data. The reader must refuse what it cannot read
// without a crash, a leak or undefined behaviour, and the two ways in must
// agree on every value and on the outcome: the file is read block by block,
// memory all at once.

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "import/ply/ply.h"
#include "scratch_file.h"

namespace {

using namespace cloudreel;

// What one read saw.
struct Outcome {
  bool headerRead = false;
  bool dataRead = false;
  std::string firstError;
  double sum = 0.0;
  long calls = 0;
  std::size_t texts = 0;
};

fuzz::ScratchFile& plyFile() {
  static fuzz::ScratchFile file("ply_fuzz.ply");
  return file;
}

void recordError(p_ply ply, const char* message) {
  void* pdata = nullptr;
  ply_get_ply_user_data(ply, &pdata, nullptr);
  auto* outcome = static_cast<Outcome*>(pdata);
  if (outcome->firstError.empty()) {
    outcome->firstError = message;
  }
}

int readValue(p_ply_argument argument) {
  void* pdata = nullptr;
  long idata = 0;
  p_ply_element element = nullptr;
  long instance = 0;
  p_ply_property property = nullptr;
  long length = 0;
  long valueIndex = 0;
  ply_get_argument_user_data(argument, &pdata, &idata);
  ply_get_argument_element(argument, &element, &instance);
  ply_get_argument_property(argument, &property, &length, &valueIndex);
  // The handles passed to a callback must be the live ones of the header.
  const char* elementName = nullptr;
  const char* propertyName = nullptr;
  ply_get_element_info(element, &elementName, nullptr);
  ply_get_property_info(property, &propertyName, nullptr, nullptr, nullptr);
  auto* outcome = static_cast<Outcome*>(pdata);
  const double value = ply_get_argument_value(argument);
  // NaN would make every later sum NaN and hide a difference.
  outcome->sum += (std::isnan(value) ? 1.0 : value) + static_cast<double>(idata + instance) +
                  static_cast<double>(length + valueIndex) + elementName[0] + propertyName[0];
  ++outcome->calls;
  return 1;
}

void readAll(p_ply ply, Outcome& outcome) {
  if (ply == nullptr || !ply_read_header(ply)) {
    return;
  }
  outcome.headerRead = true;
  for (const char* text = ply_get_next_comment(ply, nullptr); text != nullptr;
       text = ply_get_next_comment(ply, text)) {
    ++outcome.texts;
  }
  for (const char* text = ply_get_next_obj_info(ply, nullptr); text != nullptr;
       text = ply_get_next_obj_info(ply, text)) {
    ++outcome.texts;
  }
  (void)ply_storage_mode_name(ply_get_storage_mode(ply));
  long index = 0;
  for (p_ply_element element = ply_get_next_element(ply, nullptr); element != nullptr;
       element = ply_get_next_element(ply, element)) {
    const char* elementName = nullptr;
    long instances = 0;
    ply_get_element_info(element, &elementName, &instances);
    for (p_ply_property property = ply_get_next_property(element, nullptr); property != nullptr;
         property = ply_get_next_property(element, property)) {
      const char* propertyName = nullptr;
      e_ply_type type = PLY_LIST;
      e_ply_type lengthType = PLY_LIST;
      e_ply_type valueType = PLY_LIST;
      ply_get_property_info(property, &propertyName, &type, &lengthType, &valueType);
      (void)ply_type_name(type);
      (void)ply_type_name(lengthType);
      (void)ply_type_name(valueType);
      ply_set_read_cb(ply, elementName, propertyName, readValue, &outcome, index++);
    }
  }
  outcome.dataRead = ply_read(ply) != 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  Outcome inMemory;
  {
    PlyHandle ply(ply_open_from_memory(data, size, "fuzz.ply", recordError, 0, &inMemory));
    readAll(ply.get(), inMemory);
  }
  plyFile().write(data, size);
  Outcome onDisk;
  {
    PlyHandle ply(ply_open(plyFile().path().c_str(), recordError, 0, &onDisk));
    readAll(ply.get(), onDisk);
  }
  // Messages name the file, which differs; the rest must not.
  const std::string memoryName = "fuzz.ply: ";
  const std::string fileName = plyFile().path().string() + ": ";
  const bool sameError =
      inMemory.firstError.empty() == onDisk.firstError.empty() &&
      (inMemory.firstError.empty() ||
       inMemory.firstError.substr(memoryName.size()) == onDisk.firstError.substr(fileName.size()));
  const bool sameSum =
      inMemory.sum == onDisk.sum || (std::isnan(inMemory.sum) && std::isnan(onDisk.sum));
  if (inMemory.headerRead != onDisk.headerRead || inMemory.dataRead != onDisk.dataRead ||
      inMemory.calls != onDisk.calls || inMemory.texts != onDisk.texts || !sameSum || !sameError) {
    std::fprintf(stderr,
                 "ply_fuzz: memory and file disagree: header %d/%d, data %d/%d, %ld/%ld calls, "
                 "sum %g/%g\n  memory: %s\n  file: %s\n",
                 inMemory.headerRead, onDisk.headerRead, inMemory.dataRead, onDisk.dataRead,
                 inMemory.calls, onDisk.calls, inMemory.sum, onDisk.sum,
                 inMemory.firstError.c_str(), onDisk.firstError.c_str());
    std::abort();
  }
  return 0;
}
