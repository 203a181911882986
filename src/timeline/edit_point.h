#pragma once
// The small objects the timeline's editing passes around: an edit point (a
// control point together with its track, while the user edits the value
// there) and a clip insertion (a clip offered for insertion into a track,
// the payload of a menu item).

#include <memory>
#include <string_view>

#include "platform/object.h"

namespace cloudreel {

class TimelineClip;
class TimelineTrack;

class EditPoint : public Object {
 public:
  // Neither the clip nor the track is owned; an edit point whose clip or
  // track has gone does nothing.
  EditPoint(const std::shared_ptr<TimelineClip>& clip, const std::shared_ptr<TimelineTrack>& track)
      : clip_(clip), track_(track) {}

  std::string_view className() const override { return "EditPoint"; }

  std::shared_ptr<TimelineClip> clip() const { return clip_.lock(); }
  std::shared_ptr<TimelineTrack> track() const { return track_.lock(); }

  // Marks the clip as being edited, then lets the track start observing
  // its object on the clip's behalf.
  void beginEditingClip();
  // The track stops observing, copies the control point's value into the
  // clips beside it, and the clip is no longer being edited.
  void endEditingClip();
  // Passes a change of the edited property on to the clip with this edit.
  void observeChange(const Change& change);

 private:
  std::weak_ptr<TimelineClip> clip_;
  std::weak_ptr<TimelineTrack> track_;
};

class ClipInsertion : public Object {
 public:
  // Owns both.
  ClipInsertion(std::shared_ptr<TimelineClip> clip, std::shared_ptr<TimelineTrack> track)
      : clip_(std::move(clip)), track_(std::move(track)) {}

  std::string_view className() const override { return "ClipInsertion"; }

  const std::shared_ptr<TimelineClip>& clip() const { return clip_; }
  const std::shared_ptr<TimelineTrack>& track() const { return track_; }

 private:
  std::shared_ptr<TimelineClip> clip_;
  std::shared_ptr<TimelineTrack> track_;
};

}  // namespace cloudreel
