#include "scene/camera_panel_controller.h"

#include <algorithm>

#include "camera/camera_field.h"
#include "camera/scene_camera.h"
#include "camera/source_camera.h"
#include "scene/my_document.h"

namespace cloudreel {

namespace {

CameraPanelController::Row rowForCamera(const std::shared_ptr<Camera>& camera, bool numbered) {
  CameraPanelController::Row row;
  row.camera = camera;
  row.title = camera->name();
  if (numbered) {
    row.title += " " + std::to_string(camera->number());
  }
  if (const auto* source = dynamic_cast<const SourceCamera*>(camera.get())) {
    row.detail = source->photographPath().filename().string();
  }
  return row;
}

}  // namespace

void CameraPanelController::documentDidChange() { reload(); }

void CameraPanelController::documentContentsDidChange() { reload(); }

void CameraPanelController::reload() {
  groups_.clear();
  if (const auto document = this->document()) {
    if (const auto& sceneCamera = document->sceneCamera()) {
      groups_.push_back({"Document", nullptr, {rowForCamera(sceneCamera, false)}});
    }
    // The fields of the layer tree first, then stored fields that are not in
    // the tree; a field in both (an import's) is listed once.
    std::vector<std::shared_ptr<CameraPath>> paths = document->cameraPaths();
    for (const auto& stored : document->storedCameraPaths()) {
      if (std::find(paths.begin(), paths.end(), stored) == paths.end()) {
        paths.push_back(stored);
      }
    }
    for (const auto& path : paths) {
      auto field = std::dynamic_pointer_cast<CameraField>(path);
      if (!field) {
        continue;
      }
      Group group{field->name(), field, {}};
      for (const auto& camera : field->cameras()) {
        if (camera) {  // a damaged document may hold null entries
          group.rows.push_back(rowForCamera(camera, true));
        }
      }
      groups_.push_back(std::move(group));
    }
  }
  if (reloadHandler_) {
    reloadHandler_();
  }
}

bool CameraPanelController::selectCameraAt(Position position) {
  const auto document = this->document();
  if (!document || position.group >= groups_.size() ||
      position.row >= groups_[position.group].rows.size()) {
    return false;
  }
  const std::shared_ptr<Camera> camera = groups_[position.group].rows[position.row].camera;
  const std::shared_ptr<Camera> previous = document->selectedCamera();
  if (previous && previous != camera) {
    previous->setSelected(false);
  }
  camera->setSelected(true);
  document->setSelectedCamera(camera);
  // hasChanged redraws the views and, through the change notification,
  // reloads this list.
  document->hasChanged();
  return true;
}

void CameraPanelController::clearSelection() {
  const auto document = this->document();
  if (!document) {
    return;
  }
  if (const auto previous = document->selectedCamera()) {
    previous->setSelected(false);
  }
  document->setSelectedCamera(nullptr);
  document->hasChanged();
}

std::shared_ptr<Camera> CameraPanelController::selectedCamera() const {
  const auto document = this->document();
  return document ? document->selectedCamera() : nullptr;
}

std::optional<CameraPanelController::Position> CameraPanelController::selectedPosition() const {
  const auto camera = selectedCamera();
  if (!camera) {
    return std::nullopt;
  }
  for (std::size_t g = 0; g < groups_.size(); ++g) {
    for (std::size_t r = 0; r < groups_[g].rows.size(); ++r) {
      if (groups_[g].rows[r].camera == camera) {
        return Position{g, r};
      }
    }
  }
  return std::nullopt;
}

std::optional<std::filesystem::path> CameraPanelController::photographPath() const {
  const auto* source = dynamic_cast<const SourceCamera*>(selectedCamera().get());
  if (source == nullptr || source->photographPath().empty()) {
    return std::nullopt;
  }
  return source->photographPath();
}

}  // namespace cloudreel
