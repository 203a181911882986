#include "cli/point_cloud_summary.h"

#include <algorithm>

#include "import/ply/ply.h"
#include "scene/point_layer.h"

namespace cloudreel::cli {

namespace {

// The reader reports only its first failure, so one slot is enough.
void keepPlyError(p_ply ply, const char* message) {
  void* pdata = nullptr;
  ply_get_ply_user_data(ply, &pdata, nullptr);
  if (pdata != nullptr) {
    *static_cast<std::string*>(pdata) = message;
  }
}

std::string propertyType(p_ply_property property) {
  e_ply_type type = PLY_LIST;
  e_ply_type lengthType = PLY_LIST;
  e_ply_type valueType = PLY_LIST;
  ply_get_property_info(property, nullptr, &type, &lengthType, &valueType);
  if (type != PLY_LIST) {
    return ply_type_name(type);
  }
  return std::string("list ") + ply_type_name(lengthType) + " " + ply_type_name(valueType);
}

}  // namespace

PointCloudSummary summarizePointLayer(const PointLayer& layer) {
  PointCloudSummary summary;
  summary.faces = layer.nFaces();
  summary.hasNormals = layer.hasNormalsField();
  summary.bbox = layer.bbox();

  const std::size_t record = layer.recordSize();
  const std::size_t held = layer.pointArray() ? layer.pointArray()->size() / record : 0;
  const std::size_t count =
      std::min(held, static_cast<std::size_t>(std::max(layer.nPoints(), std::int32_t{0})));
  summary.points = static_cast<std::int32_t>(count);
  if (count == 0) {
    return summary;
  }
  // The luck byte ends each record: byte 15, or byte 27 with normals.
  const std::uint8_t* luck = layer.points() + record - 1;
  for (std::size_t i = 0; i < count; ++i, luck += record) {
    ++summary.luckHistogram[*luck];
  }
  return summary;
}

bool describePlyHeader(const std::filesystem::path& path, PlyHeaderDescription* header,
                       Error* error) {
  std::string reason;
  PlyHandle ply(ply_open(path.c_str(), keepPlyError, 0, &reason));
  if (!ply || !ply_read_header(ply.get())) {
    setError(error, "PLY", 1, reason.empty() ? path.string() + ": cannot read the header" : reason);
    return false;
  }
  header->format = ply_storage_mode_name(ply_get_storage_mode(ply.get()));
  header->elements.clear();
  for (p_ply_element element = ply_get_next_element(ply.get(), nullptr); element != nullptr;
       element = ply_get_next_element(ply.get(), element)) {
    PlyElementDescription& described = header->elements.emplace_back();
    const char* name = nullptr;
    ply_get_element_info(element, &name, &described.count);
    described.name = name ? name : "";
    for (p_ply_property property = ply_get_next_property(element, nullptr); property != nullptr;
         property = ply_get_next_property(element, property)) {
      const char* propertyName = nullptr;
      ply_get_property_info(property, &propertyName, nullptr, nullptr, nullptr);
      described.properties.push_back({propertyName ? propertyName : "", propertyType(property)});
    }
  }
  return true;
}

}  // namespace cloudreel::cli
