#pragma once
// The timeline window's edits of the tracks themselves, free of any
// toolkit: dragging a clip or a control point, the context menus of a
// track and a clip and the commands they carry, and adding a track for an
// animatable property of a scene object.
//
// Drags follow the habits of video editors. A control point rolls: the
// span before it ends and the span after it begins where it is dropped, so
// the track keeps its length. A span slides: it keeps its length and moves
// with its two control points, and the spans beside it give and take the
// time. Either way nothing can pass a neighbour, nothing goes before 0,
// and times land on whole frames. A drag is one undo step.

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "timeline/menu_description.h"

namespace cloudreel {

class Animatable3DObject;
class MyDocument;
class Spline;
class Timeline;
class TimelineClip;
class TimelineTrack;
class UndoManager;

class TimelineDragEdit {
 public:
  // An element of the track with its times.
  struct Span {
    std::shared_ptr<TimelineClip> clip;
    float begin;
    float duration;
  };

  // The element is a control point or a span of the track; anything else
  // (an element not in the track) makes a drag that moves nothing.
  TimelineDragEdit(std::shared_ptr<TimelineTrack> track, std::shared_ptr<TimelineClip> element,
                   std::int32_t fps);

  // Moves the element dt seconds from where it was when the drag began,
  // held between its neighbours; dt is measured from the start each time,
  // so a drag that comes back puts everything back.
  void moveTo(float dt);
  // How far the element has moved, after the limits and the frame grid.
  float movedBy() const { return moved_; }
  bool isControlPoint() const;
  // Ends the drag. When something moved, registers one undo step ("Move
  // Control Point" or "Slide Clip") on the manager (none: no undo) that puts
  // the times back, and answers true. `changed` runs after every undo and
  // redo of the step (the document redraws).
  bool commit(UndoManager* undoManager, std::function<void()> changed = {});
  // Puts every time back as it was when the drag began.
  void cancel() { moveTo(0.0f); }

 private:
  // The earliest and latest offsets the neighbours allow.
  void findLimits();
  void apply(float dt);

  std::shared_ptr<TimelineTrack> track_;
  std::shared_ptr<TimelineClip> element_;
  std::int32_t fps_;
  // The elements the drag changes, as they were: the element itself (and,
  // for a span, its two control points) move; the outer neighbours stretch.
  std::vector<Span> moving_;
  std::optional<Span> before_;
  std::optional<Span> after_;
  float lowest_ = 0.0f;
  float highest_ = 0.0f;
  float moved_ = 0.0f;
};

// The menu a right click on a track shows: the track's own items and, when
// the click was on a span, the span's items after them.
Menu timelineContextMenu(Timeline& timeline, TimelineTrack& track, TimelineClip* clip,
                         MyDocument* document);

// What the window does with a chosen item that the model leaves to it.
struct TimelineMenuHandlers {
  // "Edit Spline": open an editor on the span's spline.
  std::function<void(const std::shared_ptr<Spline>&)> editSpline;
  // Where "Remove" registers its undo (none: no undo), and what runs after
  // that undo and its redo.
  UndoManager* undoManager = nullptr;
  std::function<void()> changed;
};

// Carries out a chosen item: the item's own action where it has one (the
// ramp choices), else the window's commands by action name
// ("menuRemoveTrack:", "menuInsertFiller:", "menuAddDiscreteClip:",
// "editInPoint:", "editSpline:"). Answers whether the timeline may have
// changed (the window then redraws and the document is told).
bool performTimelineMenuItem(const MenuItem& item, Timeline& timeline,
                             const TimelineMenuHandlers& handlers);

// A track the user can add: the scene object it animates (by name) and the
// track, made but not yet in the timeline.
struct AddableTrack {
  std::string objectName;
  std::shared_ptr<TimelineTrack> track;
};

// The tracks the selected layer and the scene camera offer, leaving out
// those the timeline already has (same object and property).
std::vector<AddableTrack> addableTracks(MyDocument& document);

// Adds the track with its default content from 0 for the object's duration,
// as one undo step ("Add Track"). A document without a timeline is given
// one first.
void addTrackToDocument(MyDocument& document, const std::shared_ptr<TimelineTrack>& track);

}  // namespace cloudreel
