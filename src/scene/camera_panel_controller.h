#pragma once
// The cameras panel: the front document's cameras as a two-level list, the
// scene camera first and then every camera field of the document (those in
// the layer tree and those stored as camera paths, each once) with its
// cameras under it. Choosing a camera makes it the document's selected
// camera, the one a view in camera mode 2 looks through and the one whose
// photograph the field shows; the photograph window asks here for the
// selected camera's photograph file.

#include <cstddef>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "scene/document_panel_controller.h"

namespace cloudreel {

class Camera;
class CameraField;

class CameraPanelController : public DocumentPanelController {
 public:
  struct Row {
    std::string title;
    // The photograph's file name, empty for a camera without one.
    std::string detail;
    std::shared_ptr<Camera> camera;
  };
  struct Group {
    std::string title;
    // Null for the document's own cameras (the scene camera).
    std::shared_ptr<CameraField> field;
    std::vector<Row> rows;
  };
  // Where a camera stands in the list.
  struct Position {
    std::size_t group = 0;
    std::size_t row = 0;
    friend bool operator==(const Position&, const Position&) = default;
  };

  CameraPanelController() = default;

  // The lists as last read from the document; empty without one.
  const std::vector<Group>& groups() const { return groups_; }

  // Makes the camera at that place the document's selected camera (and the
  // only selected one of this list, so its field shows its photograph),
  // then reports the change. A place outside the lists changes nothing and
  // answers NO.
  bool selectCameraAt(Position position);
  // Deselects the document's selected camera.
  void clearSelection();
  // The document's selected camera and where it is in the lists; none when
  // no camera is selected or the selected one is not listed.
  std::shared_ptr<Camera> selectedCamera() const;
  std::optional<Position> selectedPosition() const;

  // The file named for the selected camera's photograph (the image its
  // reconstruction's list.txt names, relative to the reconstruction's
  // folder), whether or not it can be read; none for no selection or a
  // camera that was given no photograph.
  std::optional<std::filesystem::path> photographPath() const;

  // Called after the lists or the selection changed (the shell redraws).
  void setReloadHandler(std::function<void()> handler) { reloadHandler_ = std::move(handler); }

 protected:
  void documentDidChange() override;
  void documentContentsDidChange() override;

 private:
  void reload();

  std::vector<Group> groups_;
  std::function<void()> reloadHandler_;
};

}  // namespace cloudreel
