#include "cli/document_info.h"

#include <fmt/format.h>

#include <algorithm>
#include <cstdio>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "camera/camera_field.h"
#include "camera/camera_path.h"
#include "camera/scene_camera.h"
#include "camera/transform_stack.h"
#include "cli/document_input.h"
#include "cli/json_output.h"
#include "cli/point_cloud_input.h"
#include "geometry/vector3.h"
#include "scene/animated_card.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "scene/ocean_fft.h"
#include "scene/point_layer.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel::cli {

namespace {

using Json = nlohmann::ordered_json;

// A damaged document can hold a layer below itself; the walks stop there
// rather than going round for ever.
bool isAncestor(const std::vector<const Layer*>& ancestors, const Layer* layer) {
  return std::find(ancestors.begin(), ancestors.end(), layer) != ancestors.end();
}

// The counts that say what a layer holds, by kind.
void addLayerCounts(Json& json, const Layer& layer) {
  if (const auto* ocean = dynamic_cast<const OceanFFT*>(&layer)) {
    // The surface is computed, not stored: what shapes it is what it holds.
    json["grid"] = ocean->gridSize();
    json["patchSize"] = ocean->patchSize();
    json["windSpeed"] = ocean->windSpeed();
    json["windDirection"] = ocean->windDirection();
    json["amplitude"] = ocean->amplitude();
    json["choppiness"] = ocean->choppiness();
    json["seed"] = ocean->seed();
    return;
  }
  if (const auto* card = dynamic_cast<const AnimatedCard*>(&layer)) {
    json["source"] = card->imagePath();
    json["frames"] = card->nFrames();
    json["fps"] = card->FPS();
    json["width"] = card->imageWidth();
    json["height"] = card->imageHeight();
    if (!card->sourceError().empty()) {
      json["error"] = card->sourceError();
    }
    return;
  }
  if (const auto* points = dynamic_cast<const PointLayer*>(&layer)) {
    json["points"] = points->nPoints();
    json["linked"] = points->fileStoredAsLink();
    json["file"] =
        points->originalURL().empty() ? Json(nullptr) : Json(points->originalURL().string());
  }
  if (const auto* field = dynamic_cast<const CameraField*>(&layer)) {
    json["cameras"] = field->cameras().size();
  }
  if (const auto* path = dynamic_cast<const CameraPath*>(&layer)) {
    json["frames"] = path->nFrames();
  }
}

Json layerJson(const Layer& layer, std::vector<const Layer*>& ancestors) {
  Json json = {
      {"class", layer.className()}, {"name", layer.name()}, {"visible", layer.isVisible()}};
  addLayerCounts(json, layer);
  Json children = Json::array();
  ancestors.push_back(&layer);
  for (const auto& child : layer.childLayers()) {
    if (!child) {
      continue;
    }
    if (isAncestor(ancestors, child.get())) {
      children.push_back({{"class", child->className()}, {"name", child->name()}, {"loop", true}});
    } else {
      children.push_back(layerJson(*child, ancestors));
    }
  }
  ancestors.pop_back();
  json["children"] = std::move(children);
  return json;
}

Json sceneCameraJson(const SceneCamera& camera) {
  const auto position = camera.translation();
  return {
      {"name", camera.name()},       {"position", {position->x(), position->y(), position->z()}},
      {"heading", camera.heading()}, {"pitch", camera.pitch()},
      {"bank", camera.bank()},       {"fieldOfView", camera.fieldOfView()},
      {"aspect", camera.aspect()},   {"zNear", camera.zNear()},
      {"zFar", camera.zFar()}};
}

Json timelineJson(const Timeline& timeline) {
  Json tracks = Json::array();
  for (const auto& track : timeline.tracks()) {
    if (track) {
      tracks.push_back({{"class", track->className()},
                        {"title", track->title()},
                        {"clips", track->sequencedClips().size()}});
    }
  }
  return {{"fps", timeline.fps()},
          {"lengthSeconds", timeline.totalLengthInSeconds()},
          {"lengthFrames", timeline.totalLengthInFrames()},
          {"inPoint", timeline.inPoint()},
          {"outPoint", timeline.outPoint()},
          {"tracks", std::move(tracks)}};
}

Json toJson(const std::string& file, const MyDocument& document) {
  Json layers = Json::array();
  std::vector<const Layer*> ancestors;
  for (const auto& layer : document.layers()) {
    if (layer) {
      layers.push_back(layerJson(*layer, ancestors));
    }
  }
  Json paths = Json::array();
  for (const auto& path : document.cameraPaths()) {
    paths.push_back(
        {{"class", path->className()}, {"name", path->name()}, {"frames", path->nFrames()}});
  }
  Json stacks = Json::array();
  for (const auto& stack : document.transformStacks()) {
    if (stack) {
      stacks.push_back({{"name", stack->name()},
                        {"members", stack->transformations().size()},
                        {"frames", stack->nFrames()}});
    }
  }
  Json bookmarks = Json::array();
  for (const auto& entry : document.viewBookmarks().value_or(MyDocument::Bookmarks{})) {
    bookmarks.push_back(entry.first);
  }
  const auto overrideBuckets = document.overrideBuckets();
  const auto fraction = document.bucketOverrideFraction();
  return {{"file", file},
          {"layers", std::move(layers)},
          {"cameraPaths", std::move(paths)},
          {"transformStacks", std::move(stacks)},
          {"timeline", document.timeline() ? timelineJson(*document.timeline()) : Json(nullptr)},
          {"sceneCamera",
           document.sceneCamera() ? sceneCameraJson(*document.sceneCamera()) : Json(nullptr)},
          {"bookmarks", std::move(bookmarks)},
          {"overrideBuckets", overrideBuckets ? Json(*overrideBuckets) : Json(nullptr)},
          {"bucketOverrideFraction", fraction ? Json(*fraction) : Json(nullptr)}};
}

std::string plural(std::size_t n, std::string_view one, std::string_view many) {
  return fmt::format("{} {}", n, n == 1 ? one : many);
}

std::string frames(std::int32_t n) { return fmt::format("{} frame{}", n, n == 1 ? "" : "s"); }

// One line a layer, each level indented two more spaces than its parent.
void appendLayerText(std::string& text, const Layer& layer, std::vector<const Layer*>& ancestors) {
  const std::string indent(2 * (ancestors.size() + 1), ' ');
  text += fmt::format("{}{} \"{}\"{}", indent, layer.className(), layer.name(),
                      layer.isVisible() ? "" : " (hidden)");
  if (const auto* ocean = dynamic_cast<const OceanFFT*>(&layer)) {
    text += fmt::format(
        ", {0} × {0} grid over {1:g} units, wind {2:g} m/s at {3:g}°, amplitude {4:g}, "
        "choppiness {5:g}, seed {6}",
        ocean->gridSize(), ocean->patchSize(), ocean->windSpeed(), ocean->windDirection(),
        ocean->amplitude(), ocean->choppiness(), ocean->seed());
  } else if (const auto* card = dynamic_cast<const AnimatedCard*>(&layer)) {
    if (card->hasImages()) {
      text += fmt::format(", {} from {} ({} × {}) at {} fps", frames(card->nFrames()),
                          card->imagePath(), card->imageWidth(), card->imageHeight(), card->FPS());
    } else {
      text += card->imagePath().empty() ? std::string(", no pictures")
                                        : ", no pictures: " + card->sourceError();
    }
  } else if (const auto* points = dynamic_cast<const PointLayer*>(&layer)) {
    text +=
        ", " + plural(static_cast<std::size_t>(std::max(points->nPoints(), 0)), "point", "points");
    if (points->fileStoredAsLink()) {
      text += fmt::format(", linked to {}", points->originalURL().string());
    }
  }
  if (const auto* field = dynamic_cast<const CameraField*>(&layer)) {
    text += ", " + plural(field->cameras().size(), "camera", "cameras");
  } else if (const auto* path = dynamic_cast<const CameraPath*>(&layer)) {
    text += ", " + frames(path->nFrames());
  }
  text += "\n";
  ancestors.push_back(&layer);
  for (const auto& child : layer.childLayers()) {
    if (!child) {
      continue;
    }
    if (isAncestor(ancestors, child.get())) {
      text += fmt::format("{}  {} \"{}\" (again below itself)\n", indent, child->className(),
                          child->name());
    } else {
      appendLayerText(text, *child, ancestors);
    }
  }
  ancestors.pop_back();
}

std::string toText(const std::string& file, const MyDocument& document) {
  const auto paths = document.cameraPaths();
  std::string text =
      fmt::format("{}: {}, {}, {}\n", file, plural(document.layers().size(), "layer", "layers"),
                  plural(paths.size(), "camera path", "camera paths"),
                  plural(document.transformStacks().size(), "transform stack", "transform stacks"));
  text += "layers:\n";
  std::vector<const Layer*> ancestors;
  for (const auto& layer : document.layers()) {
    if (layer) {
      appendLayerText(text, *layer, ancestors);
    }
  }
  text += "camera paths:\n";
  for (const auto& path : paths) {
    text +=
        fmt::format("  {} \"{}\", {}\n", path->className(), path->name(), frames(path->nFrames()));
  }
  text += "transform stacks:\n";
  for (const auto& stack : document.transformStacks()) {
    if (stack) {
      text += fmt::format("  \"{}\", {}, {}\n", stack->name(),
                          plural(stack->transformations().size(), "member", "members"),
                          frames(stack->nFrames()));
    }
  }
  if (const auto& timeline = document.timeline()) {
    text += fmt::format("timeline: {} fps, {:g} s ({} frames), in {:g}, out {:g}, {}\n",
                        timeline->fps(), timeline->totalLengthInSeconds(),
                        timeline->totalLengthInFrames(), timeline->inPoint(), timeline->outPoint(),
                        plural(timeline->tracks().size(), "track", "tracks"));
    for (const auto& track : timeline->tracks()) {
      if (track) {
        text += fmt::format("  {} \"{}\", {}\n", track->className(), track->title(),
                            plural(track->sequencedClips().size(), "clip", "clips"));
      }
    }
  } else {
    text += "timeline: none\n";
  }
  if (const auto& camera = document.sceneCamera()) {
    const auto p = camera->translation();
    text += fmt::format(
        "scene camera \"{}\": position ({:g}, {:g}, {:g}), heading {:g}, pitch {:g}, bank {:g}, "
        "field of view {:g} deg, near {:g}, far {:g}\n",
        camera->name(), p->x(), p->y(), p->z(), camera->heading(), camera->pitch(), camera->bank(),
        camera->fieldOfView(), camera->zNear(), camera->zFar());
  }
  const auto& bookmarks = document.viewBookmarks();
  if (!bookmarks || bookmarks->empty()) {
    text += "bookmarks: none\n";
  } else {
    text += "bookmarks:\n";
    for (const auto& entry : *bookmarks) {
      text += fmt::format("  \"{}\"\n", entry.first);
    }
  }
  const auto overrideBuckets = document.overrideBuckets();
  const auto fraction = document.bucketOverrideFraction();
  text += fmt::format("bucket override: {}, fraction {}\n",
                      overrideBuckets ? (*overrideBuckets ? "on" : "off") : "not set",
                      fraction ? fmt::format("{:g}", *fraction) : std::string("not set"));
  return text;
}

}  // namespace

int describeDocument(const std::filesystem::path& path, bool json) {
  prepareForDocuments();
  MyDocument document;
  Error error;
  if (!readDocument(document, path, &error)) {
    reportFailure(error.message);
    return 1;
  }
  const std::string out =
      json ? jsonText(toJson(path.string(), document)) : toText(path.string(), document);
  if (std::fputs(out.c_str(), stdout) < 0 || std::fflush(stdout) != 0) {
    reportFailure("cannot write to standard output");
    return 1;
  }
  return 0;
}

}  // namespace cloudreel::cli
