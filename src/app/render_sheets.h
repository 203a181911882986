#pragma once
// The sheets of a timeline render: the settings sheet that asks for the
// size, planes, stereo pair, depth, range, folder and file names, and the
// progress sheet that shows each frame and offers to cancel. Both only show
// and forward: the settings live in RenderPropertiesController, the progress
// in RenderProgressController, and the run in the timeline's controller.

#include <QDialog>
#include <memory>

class QButtonGroup;
class QCheckBox;
class QComboBox;
class QDoubleSpinBox;
class QLabel;
class QLineEdit;
class QProgressBar;
class QPushButton;
class QSpinBox;

namespace cloudreel {
class RenderProgressController;
class RenderPropertiesController;
class TimelineWindowController;
}  // namespace cloudreel

namespace cloudreel::app {

// The settings sheet, modal on the window it is opened on. Its controls
// start at the controller's values (the folder at the user default, read as
// the sheet loads) and write every change straight back.
class RenderSettingsSheet : public QDialog {
  Q_OBJECT
 public:
  RenderSettingsSheet(RenderPropertiesController& settings, QWidget* window);

  // Runs the sheet: 1 when the user asked to render (the settings checked
  // and the output folder made), 0 when cancelled.
  int runModal();

  void accept() override;

 private:
  void buildControls();
  void chooseFolder();
  void presetChosen(int item);

  RenderPropertiesController& settings_;
  QComboBox* presets_ = nullptr;
  QSpinBox* width_ = nullptr;
  QSpinBox* height_ = nullptr;
  QLineEdit* folder_ = nullptr;
  QLineEdit* pattern_ = nullptr;
};

// The progress sheet: a bar from 0 to 100, the label and a cancel button.
// It follows the controller's change handler while it lives, and stays open
// until finish(): cancelling only asks the run to stop after the frame in
// flight, and the run says when it has.
class RenderProgressSheet : public QDialog {
  Q_OBJECT
 public:
  RenderProgressSheet(std::shared_ptr<RenderProgressController> progress, QWidget* window);
  ~RenderProgressSheet() override;

  // The run has ended: the sheet closes (and deletes itself when asked to
  // on close).
  void finish();

  // Escape cancels the render, as the button does, rather than hiding the
  // sheet of a render still running.
  void reject() override;

 protected:
  void closeEvent(QCloseEvent* event) override;

 private:
  void refresh();

  std::shared_ptr<RenderProgressController> progress_;
  QProgressBar* bar_ = nullptr;
  QLabel* label_ = nullptr;
  QPushButton* cancel_ = nullptr;
  bool finished_ = false;
};

// The timeline window's render command: the settings sheet on `window`,
// then (on Render) the run over the timeline's document with the progress
// sheet shown until it ends. The run advances on the main run loop, so this
// returns at once; the progress sheet (deleted when it closes) is answered,
// or null when nothing started: cancelled, no timeline, or a range or folder
// that cannot be rendered (the user is told why).
RenderProgressSheet* runTimelineRender(QWidget* window, TimelineWindowController& timeline);

}  // namespace cloudreel::app
