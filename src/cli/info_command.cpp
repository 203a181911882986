#include "cli/info_command.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <nlohmann/json.hpp>

#include "cli/document_info.h"
#include "cli/document_input.h"
#include "cli/json_output.h"
#include "cli/point_cloud_input.h"
#include "cli/point_cloud_summary.h"
#include "scene/point_layer.h"

namespace cloudreel::cli {

namespace {

nlohmann::ordered_json toJson(const std::string& file, const PointCloudSummary& summary) {
  nlohmann::ordered_json json = {
      {"file", file},           {"points", summary.points},
      {"faces", summary.faces}, {"hasNormals", summary.hasNormals},
      {"bbox", summary.bbox},   {"luckHistogram", summary.luckHistogram},
  };
  if (summary.ply) {
    nlohmann::ordered_json elements = nlohmann::ordered_json::array();
    for (const PlyElementDescription& element : summary.ply->elements) {
      nlohmann::ordered_json properties = nlohmann::ordered_json::array();
      for (const PlyPropertyDescription& property : element.properties) {
        properties.push_back({{"name", property.name}, {"type", property.type}});
      }
      elements.push_back(
          {{"name", element.name}, {"count", element.count}, {"properties", properties}});
    }
    json["ply"] = {{"format", summary.ply->format},
                   {"elements", elements},
                   {"hasColor", summary.ply->hasColor}};
  }
  if (summary.bundle) {
    json["bundle"] = {{"cameras", summary.bundle->cameras}, {"points", summary.bundle->points}};
  }
  if (summary.cameras) {
    nlohmann::ordered_json cameras = nlohmann::ordered_json::array();
    for (const CameraDescription& camera : *summary.cameras) {
      nlohmann::ordered_json image = nullptr;
      if (camera.image) {
        image = {{"width", (*camera.image)[0]}, {"height", (*camera.image)[1]}};
      }
      cameras.push_back({{"index", camera.index},
                         {"focal", camera.focal},
                         {"k1", camera.k1},
                         {"k2", camera.k2},
                         {"centre", camera.centre},
                         {"fieldOfView", camera.fieldOfView},
                         {"image", image}});
    }
    json["cameras"] = cameras;
  }
  return json;
}

std::string toText(const std::string& file, const PointCloudSummary& summary) {
  std::string text = fmt::format("{}: {} points, {} faces, {}-byte records {} normals\n", file,
                                 summary.points, summary.faces, summary.hasNormals ? 28 : 16,
                                 summary.hasNormals ? "with" : "without");
  const Layer::BoundingBox& b = summary.bbox;
  text += fmt::format("bounding box: x {:g} .. {:g}, y {:g} .. {:g}, z {:g} .. {:g}\n", b[0], b[3],
                      b[1], b[4], b[2], b[5]);
  // Sixteen groups of sixteen luck values, four groups a line.
  text += "luck histogram (points per 16 luck values):\n";
  for (int group = 0; group < 16; ++group) {
    std::uint64_t sum = 0;
    for (int luck = group * 16; luck < group * 16 + 16; ++luck) {
      sum += summary.luckHistogram[static_cast<std::size_t>(luck)];
    }
    text += fmt::format("  {:>3}-{:<3} {:>10}", group * 16, group * 16 + 15, sum);
    text += group % 4 == 3 ? "\n" : "";
  }
  if (summary.ply) {
    text += fmt::format("PLY header, format {}:\n", summary.ply->format);
    for (const PlyElementDescription& element : summary.ply->elements) {
      text += fmt::format("  element {} {}\n", element.name, element.count);
      for (const PlyPropertyDescription& property : element.properties) {
        text += fmt::format("    property {} {}\n", property.type, property.name);
      }
    }
    if (!summary.ply->hasColor) {
      text += "  no colour: points are white\n";
    }
  }
  if (summary.bundle) {
    text += fmt::format("bundle header: {} cameras, {} points\n", summary.bundle->cameras,
                        summary.bundle->points);
  }
  if (summary.cameras) {
    text += fmt::format("{} cameras:\n", summary.cameras->size());
    for (const CameraDescription& camera : *summary.cameras) {
      const auto& c = camera.centre;
      text +=
          fmt::format("  {:>4}: focal {:g}, centre ({:g}, {:g}, {:g}), field of view {:.2f} deg, ",
                      camera.index, camera.focal, c[0], c[1], c[2], camera.fieldOfView);
      text += camera.image
                  ? fmt::format("photograph {}x{}\n", (*camera.image)[0], (*camera.image)[1])
                  : std::string("no photograph\n");
    }
  }
  return text;
}

}  // namespace

CLI::App* addInfoCommand(CLI::App& app, InfoOptions& options) {
  CLI::App* command = app.add_subcommand(
      "info",
      "Describe a .reel document, or the point layer a .rwb, .ply or Bundler .out file opens as.");
  command
      ->add_option("FILE", options.file,
                   "a .reel document, a .rwb point file, a .ply file or a Bundler .out file")
      ->required();
  command->add_flag("--json", options.json, "print one JSON object instead of text");
  command->footer(
      "The JSON object has \"file\", \"points\", \"faces\", \"hasNormals\" (28-byte records with "
      "normals), \"bbox\" ([minX, minY, minZ, maxX, maxY, maxZ]) and \"luckHistogram\" (256 "
      "counts of records by luck value); for a PLY file also \"ply\": {\"format\", \"elements\": "
      "[{\"name\", \"count\", \"properties\": [{\"name\", \"type\"}]}], \"hasColor\"}, where a "
      "list property's type reads \"list <length type> <value type>\", e.g. \"list uchar int\", "
      "and \"hasColor\" is false when the vertices have no colour (imported white); for a bundle "
      "file also \"bundle\": {\"cameras\", \"points\"} (the counts its header claims) and "
      "\"cameras\": [{\"index\", \"focal\", \"k1\", \"k2\", \"centre\" ([x, y, z]), "
      "\"fieldOfView\" (degrees, from the photograph's width), \"image\": {\"width\", "
      "\"height\"} or null when the photograph is missing}].\n"
      "A PLY file is described as imported: every vertex, positions and colours only; a bundle "
      "file too: its points, and its cameras with the photographs named by the list.txt two "
      "folders up.\n"
      "For a .reel document the JSON object has \"file\", \"layers\" (the layer tree: each "
      "{\"class\", \"name\", \"visible\", \"children\": [...]}, with \"points\", \"linked\" and "
      "\"file\" for point layers, \"frames\" for camera paths and \"cameras\" for a bundle "
      "file's camera field), \"cameraPaths\" (every camera path in the tree, depth first: "
      "{\"class\", \"name\", \"frames\"}), \"transformStacks\" ([{\"name\", \"members\", "
      "\"frames\"}]), \"timeline\" (null, or {\"fps\", \"lengthSeconds\", \"lengthFrames\", "
      "\"inPoint\", \"outPoint\", \"tracks\": [{\"class\", \"title\", \"clips\"}]}), "
      "\"sceneCamera\" ({\"name\", \"position\", \"heading\", \"pitch\", \"bank\", "
      "\"fieldOfView\" (degrees), \"aspect\", \"zNear\", \"zFar\"}), \"bookmarks\" (names), "
      "\"overrideBuckets\" and \"bucketOverrideFraction\" (null in files written before "
      "they existed). A document whose linked point file is missing is refused, naming the "
      "file.");
  return command;
}

int runInfoCommand(const InfoOptions& options) {
  const std::filesystem::path path = options.file;
  if (isDocumentFile(path)) {
    return describeDocument(path, options.json);
  }
  const PointFileKind kind = pointFileKind(path);
  std::optional<PlyHeaderDescription> header;
  if (kind == PointFileKind::Ply) {
    // The header is read first and on its own, so a file that is no PLY at
    // all is reported with the reader's reason before any import starts.
    Error error;
    PlyHeaderDescription described;
    if (!checkReadable(path, &error)) {
      reportFailure(error.message);
      return 1;
    }
    if (!describePlyHeader(path, &described, &error)) {
      reportFailure(fmt::format("cannot read the PLY header of {}", error.message));
      return 1;
    }
    header = std::move(described);
  }
  std::optional<BundleHeaderDescription> bundle;
  if (kind == PointFileKind::Bundler) {
    // The import takes any text for a bundle file of nothing, so the counts
    // line is checked first: that is what tells a bundle file.
    Error error;
    BundleHeaderDescription counts;
    if (!checkReadable(path, &error) || !describeBundleHeader(path, &counts, &error)) {
      reportFailure(error.message);
      return 1;
    }
    bundle = counts;
  }

  // A PLY file in a layout that can be measured in passing is not imported:
  // its summary needs no array of 16 bytes a point.
  std::optional<PointCloudSummary> measured;
  if (kind == PointFileKind::Ply) {
    measured = measurePlyPointCloud(path);
  }
  PointCloudSummary summary;
  if (measured) {
    announceLargeFile(path);
    summary = std::move(*measured);
  } else {
    Error error;
    const std::shared_ptr<PointLayer> layer = openPointCloud(path, kind, 1, &error);
    if (!layer) {
      reportFailure(error.message);
      return 1;
    }
    summary = summarizePointLayer(*layer);
  }
  summary.ply = std::move(header);
  summary.bundle = bundle;

  const std::string out =
      options.json ? jsonText(toJson(options.file, summary)) : toText(options.file, summary);
  if (std::fputs(out.c_str(), stdout) < 0 || std::fflush(stdout) != 0) {
    reportFailure("cannot write to standard output");
    return 1;
  }
  return 0;
}

}  // namespace cloudreel::cli
