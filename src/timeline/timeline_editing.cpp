#include "timeline/timeline_editing.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "camera/scene_camera.h"
#include "platform/log.h"
#include "platform/undo_manager.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "timeline/edit_point.h"
#include "timeline/timeline.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

// --- dragging

TimelineDragEdit::TimelineDragEdit(std::shared_ptr<TimelineTrack> track,
                                   std::shared_ptr<TimelineClip> element, std::int32_t fps)
    : track_(std::move(track)), element_(std::move(element)), fps_(fps) {
  if (!track_ || !element_) {
    return;
  }
  const auto& list = track_->sequencedClips();
  const int k = track_->indexOfClip(element_.get());
  if (k < 0) {
    return;
  }
  const auto span = [](const std::shared_ptr<TimelineClip>& c) {
    return Span{c, c->begin(), c->duration()};
  };
  const auto at = [&](int i) -> std::shared_ptr<TimelineClip> {
    return i >= 0 && static_cast<std::size_t>(i) < list.size() ? list[static_cast<std::size_t>(i)]
                                                               : nullptr;
  };
  int first = k;
  int last = k;
  moving_.push_back(span(element_));
  if (!element_->isControlPoint()) {
    // A span takes its two control points along.
    if (const auto c = at(k - 1); c && c->isControlPoint()) {
      moving_.push_back(span(c));
      first = k - 1;
    }
    if (const auto c = at(k + 1); c && c->isControlPoint()) {
      moving_.push_back(span(c));
      last = k + 1;
    }
  }
  // Neighbours that are spans stretch; a control point next to the moving
  // group (a track out of its usual alternation) cannot, and so holds the
  // group where it is on that side.
  const auto neighbourBefore = at(first - 1);
  const auto neighbourAfter = at(last + 1);
  float earliest = std::numeric_limits<float>::max();
  float latest = std::numeric_limits<float>::lowest();
  for (const Span& s : moving_) {
    earliest = std::min(earliest, s.begin);
    latest = std::max(latest, s.begin + s.duration);
  }
  if (!neighbourBefore) {
    lowest_ = -earliest;  // nothing before 0
  } else if (!neighbourBefore->isControlPoint()) {
    before_ = span(neighbourBefore);
    lowest_ = before_->begin - earliest;
  }
  if (!neighbourAfter) {
    highest_ = std::numeric_limits<float>::max();  // the track grows
  } else if (!neighbourAfter->isControlPoint()) {
    after_ = span(neighbourAfter);
    highest_ = after_->begin + after_->duration - latest;
  }
  // A track already out of order leaves no room; the drag moves nothing.
  lowest_ = std::min(lowest_, 0.0f);
  highest_ = std::max(highest_, 0.0f);
}

bool TimelineDragEdit::isControlPoint() const { return element_ && element_->isControlPoint(); }

void TimelineDragEdit::moveTo(float dt) {
  if (moving_.empty() || !std::isfinite(dt)) {
    return;
  }
  // The element's own begin lands on a whole frame. Less than half a frame
  // is no move at all, so a click (or a drag brought back) leaves an
  // element that was between frames where it was.
  float offset = dt;
  if (fps_ > 0 && std::fabs(dt) * static_cast<float>(fps_) < 0.5f) {
    offset = 0.0f;
  } else if (fps_ > 0) {
    const float begin = moving_.front().begin;
    const double frame = std::round((static_cast<double>(begin) + dt) * fps_);
    offset = static_cast<float>(frame / fps_ - begin);
  }
  offset = std::clamp(offset, lowest_, highest_);
  apply(offset);
  moved_ = offset;
}

void TimelineDragEdit::apply(float dt) {
  for (const Span& s : moving_) {
    s.clip->setBegin(s.begin + dt);
  }
  if (before_) {
    before_->clip->setDuration(before_->duration + dt);
  }
  if (after_) {
    after_->clip->setBegin(after_->begin + dt);
    after_->clip->setDuration(after_->duration - dt);
  }
}

namespace {

using Span = TimelineDragEdit::Span;

// Sets the times and registers the step that sets the others back: run as
// an undo, that registration becomes the redo.
void restoreTimes(UndoManager& undo, const std::string& name, const std::vector<Span>& to,
                  const std::vector<Span>& from, const std::function<void()>& changed) {
  for (const Span& t : to) {
    t.clip->setBegin(t.begin);
    t.clip->setDuration(t.duration);
  }
  undo.registerUndoWithTarget(
      &undo, [&undo, name, to, from, changed] { restoreTimes(undo, name, from, to, changed); });
  undo.setActionName(name);
  if (changed) {
    changed();
  }
}

}  // namespace

bool TimelineDragEdit::commit(UndoManager* undoManager, std::function<void()> changed) {
  if (moving_.empty() || moved_ == 0.0f) {
    return false;
  }
  // What the drag changed, as it was and as it is now.
  std::vector<Span> was = moving_;
  for (const auto& side : {before_, after_}) {
    if (side) {
      was.push_back(*side);
    }
  }
  if (undoManager != nullptr) {
    std::vector<Span> now;
    for (const Span& s : was) {
      now.push_back({s.clip, s.clip->begin(), s.clip->duration()});
    }
    const std::string name = isControlPoint() ? "Move Control Point" : "Slide Clip";
    undoManager->registerUndoWithTarget(undoManager, [undoManager, name, was, now, changed] {
      restoreTimes(*undoManager, name, was, now, changed);
    });
    undoManager->setActionName(name);
  }
  return true;
}

// --- menus

Menu timelineContextMenu(Timeline& timeline, TimelineTrack& track, TimelineClip* clip,
                         MyDocument* document) {
  Menu menu;
  track.addItemsToMenu(menu, &timeline, document);
  if (clip != nullptr && !clip->isControlPoint()) {
    clip->addItemsToMenu(menu, &timeline, &track, document);
  }
  return menu;
}

namespace {

// The undo steps hold the timeline weakly: a document given another
// timeline leaves steps that find theirs gone and do nothing.
using WeakTimeline = std::weak_ptr<Object>;

std::shared_ptr<Timeline> lock(const WeakTimeline& weak) {
  return std::static_pointer_cast<Timeline>(weak.lock());
}

void removeTrackUndoably(const WeakTimeline& weak, const std::shared_ptr<TimelineTrack>& track,
                         UndoManager* undo, const std::function<void()>& changed);

void insertTrackUndoably(const WeakTimeline& weak, const std::shared_ptr<TimelineTrack>& track,
                         int index, UndoManager* undo, const std::function<void()>& changed,
                         const std::string& name) {
  const auto timeline = lock(weak);
  if (!timeline) {
    return;
  }
  timeline->insertTrackAtIndex(track, index);
  if (undo != nullptr) {
    undo->registerUndoWithTarget(timeline.get(), [weak, track, undo, changed] {
      removeTrackUndoably(weak, track, undo, changed);
    });
    undo->setActionName(name);
  }
  if (changed) {
    changed();
  }
}

void removeTrackUndoably(const WeakTimeline& weak, const std::shared_ptr<TimelineTrack>& track,
                         UndoManager* undo, const std::function<void()>& changed) {
  const auto timeline = lock(weak);
  const int index = timeline ? timeline->indexOfTrack(*track) : -1;
  if (index < 0) {
    return;
  }
  timeline->menuRemoveTrack(*track);
  if (undo != nullptr) {
    undo->registerUndoWithTarget(timeline.get(), [weak, track, index, undo, changed] {
      insertTrackUndoably(weak, track, index, undo, changed, "Remove Track");
    });
    undo->setActionName("Remove Track");
  }
  if (changed) {
    changed();
  }
}

}  // namespace

bool performTimelineMenuItem(const MenuItem& item, Timeline& timeline,
                             const TimelineMenuHandlers& handlers) {
  if (item.perform) {
    item.perform(item);
    return true;
  }
  const std::string& action = item.action;
  if (action == "menuRemoveTrack:") {
    if (const auto track = std::dynamic_pointer_cast<TimelineTrack>(item.representedObject)) {
      removeTrackUndoably(timeline.weak_from_this(), track, handlers.undoManager, handlers.changed);
      return true;
    }
  } else if (action == "menuInsertFiller:") {
    if (const auto track = std::dynamic_pointer_cast<TimelineTrack>(item.representedObject)) {
      return timeline.menuInsertFiller(*track);
    }
  } else if (action == "menuAddDiscreteClip:") {
    if (const auto insertion = std::dynamic_pointer_cast<ClipInsertion>(item.representedObject)) {
      return timeline.menuAddDiscreteClip(*insertion);
    }
  } else if (action == "editInPoint:") {
    if (const auto clip = std::dynamic_pointer_cast<TimelineClip>(item.representedObject)) {
      logf("edit to left of clip %s", clip->description());
    }
  } else if (action == "editSpline:") {
    const auto clip = std::dynamic_pointer_cast<TimelineClip>(item.representedObject);
    if (clip && handlers.editSpline) {
      handlers.editSpline(clip->spline());
    }
  }
  return false;
}

// --- adding tracks

namespace {

bool sameBinding(const TimelineTrack& a, const TimelineTrack& b) {
  return a.className() == b.className() && a.theObject() == b.theObject() &&
         a.managedKey() == b.managedKey();
}

}  // namespace

std::vector<AddableTrack> addableTracks(MyDocument& document) {
  std::vector<std::pair<std::string, std::shared_ptr<Animatable3DObject>>> objects;
  if (const auto layer = document.selectedLayer()) {
    objects.emplace_back(layer->name().empty() ? std::string("Layer") : layer->name(), layer);
  }
  if (const auto camera = document.sceneCamera()) {
    objects.emplace_back("Scene Camera", camera);
  }
  const auto timeline = document.timeline();
  std::vector<AddableTrack> addable;
  for (const auto& [name, object] : objects) {
    std::vector<std::shared_ptr<TimelineTrack>> offered;
    object->getAnimatablePropsInArray(offered);
    for (auto& track : offered) {
      const bool present =
          timeline && std::any_of(timeline->tracks().begin(), timeline->tracks().end(),
                                  [&](const auto& existing) {
                                    return existing && sameBinding(*existing, *track);
                                  });
      if (track && !present) {
        addable.push_back({name, std::move(track)});
      }
    }
  }
  return addable;
}

void addTrackToDocument(MyDocument& document, const std::shared_ptr<TimelineTrack>& track) {
  if (!track) {
    return;
  }
  if (!document.timeline()) {
    document.setTimeline(std::make_shared<Timeline>());
  }
  Timeline& timeline = *document.timeline();
  if (track->sequencedClips().empty()) {
    track->addDefaultClipAtTime(0.0f, track->objectDurationInSeconds());
  }
  MyDocument* doc = &document;
  insertTrackUndoably(
      timeline.weak_from_this(), track, static_cast<int>(timeline.tracks().size()),
      &document.undoManager(), [doc] { doc->hasChanged(); }, "Add Track");
}

}  // namespace cloudreel
