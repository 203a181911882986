#include "cli/point_cloud_summary.h"

#include <algorithm>

#include "camera/camera_field.h"
#include "camera/source_camera.h"
#include "cli/standard_error_capture.h"
#include "import/ply/ply.h"
#include "import/ply_file.h"
#include "import/text_scanner.h"
#include "platform/byte_stream.h"
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

CameraDescription describeCamera(const Camera& camera) {
  CameraDescription described;
  described.index = camera.number();
  const AffineTransform::Matrix& placement = camera.objectToWorld()->mx();
  // Adding +0 turns the negative zeros of −Rᵀt (an axis-aligned camera
  // has them) into zeros, so they do not print as "-0".
  described.centre = {placement[12] + 0.0, placement[13] + 0.0, placement[14] + 0.0};
  described.fieldOfView = camera.fieldOfView();
  if (const auto* source = dynamic_cast<const SourceCamera*>(&camera)) {
    described.focal = source->focal();
    described.k1 = source->k1();
    described.k2 = source->k2();
    if (source->hasImage()) {
      described.image = {source->imageWidth(), source->imageHeight()};
    }
  }
  return described;
}

}  // namespace

PointCloudSummary summarizePointLayer(const PointLayer& layer) {
  PointCloudSummary summary;
  if (layer.childLayerCount() > 0) {
    if (const auto field = std::dynamic_pointer_cast<CameraField>(layer.childLayers()[0])) {
      summary.cameras.emplace();
      for (const std::shared_ptr<Camera>& camera : field->cameras()) {
        if (camera) {
          summary.cameras->push_back(describeCamera(*camera));
        }
      }
    }
  }
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

std::optional<PointCloudSummary> measurePlyPointCloud(const std::filesystem::path& path) {
  StandardErrorCapture capture;
  const std::optional<PLYFile::Extent> extent = PLYFile::measureURLDownsample(path, 1);
  if (!extent) {
    (void)capture.release();
    return std::nullopt;
  }
  // The layer of such a file has 16-byte records, no faces and no camera
  // field, and numbers its records' luck 0-255 over and over.
  PointCloudSummary summary;
  summary.points = extent->nPoints;
  summary.bbox = extent->bbox;
  const auto count = static_cast<std::uint64_t>(std::max(extent->nPoints, std::int32_t{0}));
  for (std::size_t luck = 0; luck < summary.luckHistogram.size(); ++luck) {
    summary.luckHistogram[luck] = count / 256 + (luck < count % 256 ? 1 : 0);
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
  header->hasColor = false;
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
  // The import reads the first "vertex" element only.
  const auto vertex =
      std::find_if(header->elements.begin(), header->elements.end(),
                   [](const PlyElementDescription& e) { return e.name == "vertex"; });
  if (vertex != header->elements.end()) {
    header->hasColor = std::any_of(
        vertex->properties.begin(), vertex->properties.end(),
        [](const PlyPropertyDescription& p) { return PLYFile::propertyGivesColor(p.name); });
  }
  return true;
}

bool describeBundleHeader(const std::filesystem::path& path, BundleHeaderDescription* header,
                          Error* error) {
  const auto in = FileInputStream::open(path, error);
  if (!in) {
    return false;
  }
  // The first line is the format's comment, whatever it says; the counts
  // follow it.
  TextScanner scanner(*in);
  if (!scanner.readLine()) {
    // In the import's words, as the same file's import would fail.
    setError(error, "cloudreel", 1,
             "cannot read points from " + path.string() + ": File corrupt: short read");
    return false;
  }
  std::int64_t cameras = -1;
  std::int64_t points = -1;
  if (!scanner.scan(cameras) || !scanner.scan(points) || cameras < 0 || points < 0) {
    setError(
        error, "cloudreel", 1,
        path.string() + ": not a bundle file (no camera and point counts after its first line)");
    return false;
  }
  header->cameras = cameras;
  header->points = points;
  return true;
}

}  // namespace cloudreel::cli
