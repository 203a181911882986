#pragma once
// The floating photograph window: the photograph of the front document's
// selected camera, scaled to fit the window with its proportions kept, or a
// line saying why there is none.

#include <QImage>
#include <QString>
#include <QWidget>
#include <filesystem>
#include <optional>

#include "scene/camera_panel_controller.h"

class QLabel;

namespace cloudreel::app {

class PhotographWindow : public QWidget {
  Q_OBJECT
 public:
  explicit PhotographWindow(std::shared_ptr<MyDocument> frontDocument, QWidget* parent = nullptr);

  // The photograph shown at its own size; null when none is shown.
  const QImage& image() const { return image_; }
  // The text shown instead of a photograph; empty while one is shown.
  QString message() const;
  QLabel& label() { return *label_; }

 protected:
  void resizeEvent(QResizeEvent* event) override;

 private:
  void reload();
  void showScaled();

  CameraPanelController controller_;
  QLabel* label_ = nullptr;
  QImage image_;
  // What is shown now: the file, or none; a repeat of the same file after a
  // document change is not read again.
  std::optional<std::optional<std::filesystem::path>> shown_;
  std::shared_ptr<Camera> shownCamera_;
};

}  // namespace cloudreel::app
