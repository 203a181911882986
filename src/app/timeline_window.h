#pragma once
// The timeline window: one for the application, showing the timeline of
// the document in front. The transport buttons and keys, the marks, cut
// and lift, the zoom of the time axis, adding a track for a property of the
// selected layer, and the render of the timeline all go to the core's
// TimelineWindowController and timeline edits; this window lays them out.

#include <QWidget>
#include <memory>

#include "scene/document_panel_controller.h"
#include "timeline/timeline_window_controller.h"

class QLabel;
class QMenu;
class QScrollArea;
class QSlider;
class QToolButton;

namespace cloudreel::app {

class Application;
class TimelineHeaderView;
class TimelineTrackArea;

class TimelineWindow : public QWidget, public TimelineViewDelegate, public Observer {
  Q_OBJECT
 public:
  explicit TimelineWindow(Application& application);
  ~TimelineWindow() override;

  TimelineWindowController& controller() { return controller_; }
  TimelineTrackArea& trackArea() { return *area_; }
  TimelineHeaderView& headerView() { return *header_; }
  QToolButton& addTrackButton() { return *addTrack_; }
  QString cursorLabelText() const;

  // --- TimelineViewDelegate
  void setCursorForTime(float t) override;
  void setCursorLabel(std::string_view text) override;
  void setNeedsDisplay() override;

  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;

 private:
  // Follows the front document for the controller.
  class Follower : public DocumentPanelController {
   public:
    explicit Follower(TimelineWindow& window) : window_(window) {}

   protected:
    void documentDidChange() override;
    void documentContentsDidChange() override;

   private:
    TimelineWindow& window_;
  };

  QWidget* buildTransport();
  void addShortcuts();
  void fillAddTrackMenu(QMenu* menu);
  void zoomBy(int steps);
  void routePlayback(bool toDocument);
  void refresh();

  Application& application_;
  TimelineWindowController controller_;
  TimelineHeaderView* header_ = nullptr;
  TimelineTrackArea* area_ = nullptr;
  QScrollArea* areaScroll_ = nullptr;
  QLabel* cursorLabel_ = nullptr;
  QToolButton* addTrack_ = nullptr;
  QSlider* zoom_ = nullptr;
  std::unique_ptr<Follower> follower_;
};

}  // namespace cloudreel::app
