#pragma once
// The view controls panel: the front window's view settings (view mode,
// anaglyph glasses, eye separation, which camera the view looks through)
// and its camera-path playback (the path to play, frames per second, loop,
// play, stop and single steps). The panel follows the front document like
// every panel, and the shell hands it the front window's view; the settings
// belong to the view, not to the document, so changing them is no edit and
// no undo step.

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/object.h"
#include "scene/document_panel_controller.h"

namespace cloudreel {

class CameraPath;
class PointsDocumentGLView;

class ViewControlsController : public DocumentPanelController {
 public:
  ViewControlsController();
  ~ViewControlsController() override;

  // The view the controls act on; null (or a view that has gone) disables
  // them. Changes the view makes itself (keys, playback frames) are heard
  // and reported through the reload handler.
  void setView(const std::shared_ptr<PointsDocumentGLView>& view);
  std::shared_ptr<PointsDocumentGLView> view() const { return view_.lock(); }

  // The choices' titles, in the order of their values (the glasses from
  // type 1, the others from 0).
  static const std::vector<std::string>& viewModeTitles();
  static const std::vector<std::string>& glassesTitles();
  static const std::vector<std::string>& cameraModeTitles();

  // The view's values; neutral ones (0, 1, off) without a view. Setters do
  // nothing without a view.
  int viewMode() const;
  void setViewMode(int mode);
  int glassesType() const;
  // Types outside 1..6 are held to that range.
  void setGlassesType(int type);
  float eyeSeparation() const;
  // Not-a-number is ignored; negative separations swap the eyes, which is
  // the user's choice to make.
  void setEyeSeparation(float separation);
  int cameraMode() const;
  void setCameraMode(int mode);
  float framesPerSecond() const;
  // Held to 1..240 frames per second so that playback always has a timer
  // interval; takes effect at the next start.
  void setFramesPerSecond(float fps);
  bool loopAnimation() const;
  void setLoopAnimation(bool loop);

  // --- playback. The paths offered: every camera path of the layer tree,
  // then the stored paths not in it, then the transform stacks.
  std::vector<std::shared_ptr<CameraPath>> playablePaths() const;
  std::vector<std::string> playablePathTitles() const;
  // The chosen path's index (the first path until one is chosen); none when
  // there is no path.
  std::optional<std::size_t> selectedPathIndex() const;
  void selectPath(std::size_t index);
  bool isPlaying() const;
  // The view's frame of the path being played (or stepped).
  int animframe() const;
  // Play, stop and step the chosen path in the view; nothing without a view
  // or a path.
  void play();
  void stop();
  void step();
  // Makes the chosen path the document's selected layer, the path the
  // camera-path render writes; NO without a document or a path.
  bool selectPathForRender();

  // Called after anything shown changed (the shell redraws).
  void setReloadHandler(std::function<void()> handler) { reloadHandler_ = std::move(handler); }

 protected:
  void documentDidChange() override;
  void documentContentsDidChange() override { reload(); }

 private:
  void reload();
  std::shared_ptr<CameraPath> selectedPath() const;
  void stopObservingView();

  std::weak_ptr<PointsDocumentGLView> view_;
  CallbackObserver viewObserver_;
  std::weak_ptr<CameraPath> chosenPath_;
  std::function<void()> reloadHandler_;
};

}  // namespace cloudreel
