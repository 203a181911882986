#pragma once
// One row of the timeline: the clips that animate one property of one scene
// object, laid out in time. The list alternates control points and spans,
// beginning and ending with a control point: cp(t0), clip, cp(t1), clip ...
// where each span runs from the control point before it to the one after.
// Lookups scan the list in order and do not rely on it being sorted; their
// tie-breaks are part of their contract.
//
// This base class drives an object's own frame (`setFrameForTime`); the
// subclasses drive a float property (FloatValueTrack) or the object's
// animation transform (AffineTrack), and the ruler (TimecodeTrack) drives
// nothing.

#include <cstdint>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "platform/object.h"

namespace cloudreel {

class EditPoint;
class MyDocument;
class Timeline;
class TimelineClip;
struct Menu;

class TimelineTrack : public Object {
 public:
  using ClipList = std::vector<std::shared_ptr<TimelineClip>>;

  // No object; height 26, 25 fps, nothing selected.
  TimelineTrack();
  // The object is not owned: a track whose object has gone applies nothing.
  TimelineTrack(const ObjectPtr& object, std::string keyPath, std::string title);
  TimelineTrack(const ObjectPtr& object, std::string keyPath,
                std::set<std::string> observablePaths);

  std::string_view className() const override { return "TimelineTrack"; }
  const PropertyTable& properties() const override;

  const ClipList& sequencedClips() const { return sequencedClips_; }
  // The list itself, for the edits of clips (splitting inserts into it).
  ClipList& mutableSequencedClips() { return sequencedClips_; }
  // The index of the clip in the list, -1 when it is not there.
  int indexOfClip(const TimelineClip* clip) const;

  ObjectPtr theObject() const { return theObject_.lock(); }
  const std::string& managedKey() const { return managedKey_; }
  const std::string& title() const { return title_; }
  const std::set<std::string>& observablePaths() const { return observablePaths_; }
  bool isSelectedForEditing() const { return isSelectedForEditing_; }
  std::int32_t fpsTimes100() const { return fpsTimes100_; }
  virtual double timelineHeight() const { return timelineHeight_; }
  virtual bool isEditable() const { return true; }
  virtual bool canRemove() const { return true; }

  void setTitle(std::string v) { changeValueForKey("title", title_, std::move(v)); }
  void setIsSelectedForEditing(bool v) {
    changeValueForKey("isSelectedForEditing", isSelectedForEditing_, v);
  }
  void setTimelineHeight(double v) { changeValueForKey("timelineHeight", timelineHeight_, v); }
  void setFpsTimes100(std::int32_t v) { changeValueForKey("fps_times_100", fpsTimes100_, v); }

  // --- lookups
  // The first span (never a control point) with begin <= t < end.
  std::shared_ptr<TimelineClip> clipForTime(float t) const;
  // The first control point within 0.00001 s of t.
  std::shared_ptr<TimelineClip> controlPointForTime(float t) const;
  // The control point nearest to t closer than d; of two equally near, the
  // earlier in the list.
  std::shared_ptr<TimelineClip> controlPointWithin(float d, float t) const;
  // The elements just before and after the clip in the list; null when
  // there is none or the clip is not in the list.
  std::shared_ptr<TimelineClip> controlPointToLeftOfClip(const TimelineClip& clip) const;
  std::shared_ptr<TimelineClip> controlPointToRightOfClip(const TimelineClip& clip) const;
  // The last control point in list order before t; the first after t.
  std::shared_ptr<TimelineClip> editToLeftOfTime(float t) const;
  std::shared_ptr<TimelineClip> editToRightOfTime(float t) const;
  // The end of the last element (its begin for a control point); 0 when
  // empty.
  float totalLengthInSeconds() const;
  // The object's own durationInSeconds where it has one, else 20 s.
  float objectDurationInSeconds() const;

  // --- editing
  // Splits the span at t; a time in no span changes nothing.
  void addEditAtTime(float t);
  void justAddClip(std::shared_ptr<TimelineClip> clip);
  // Appends the track's default content from t for d seconds (the list is
  // expected to be empty): here a plain clip.
  virtual void addDefaultClipAtTime(float t, float d);
  // A ripple insert of the clip at t: the span there is split, the clip goes
  // in at t and everything after it moves later by the clip's duration. On
  // an empty track the clip goes in unchanged between control points at 0
  // and at its duration. A time that no span covers, or a span that cannot
  // be split, is refused: the track is left as it was and false answered.
  bool insertClipInSequenceAt(std::shared_ptr<TimelineClip> clip, float t);
  // Makes sure there are control points at a and b, then removes what lies
  // between them except the element just before the one at b. Later
  // material stays where it is.
  void liftFrom(float a, float b);
  // The same removal, with the control point at b and everything after it
  // moved earlier by b - a.
  void cutFrom(float a, float b);

  // --- applying and editing values
  virtual void applyEffectForTime(float t);
  // The user finished editing the value of this control point.
  virtual void applyControlPointChange(TimelineClip& controlPoint);
  virtual void beginObservingObjectForEdit(EditPoint& edit);
  virtual void endObservingObjectForEdit(EditPoint& edit);

  // A click on the track's header toggles it for timeline-wide edits.
  void wasClicked() { setIsSelectedForEditing(!isSelectedForEditing_); }
  virtual std::string currentValueDescription() const;
  void dumpSequence() const;

  // The track's context menu: "Remove" where the track can be removed, the
  // kind's own items, then "Insert Filler".
  void addItemsToMenu(Menu& menu, Timeline* timeline, MyDocument* document);
  virtual void insertAddableMenuItemsInMenu(Menu& menu, MyDocument* document);

  virtual std::string description() const;

  // "sequencedClips", "fps_times_100", "theObject" (a reference to the
  // object, which the document archive holds), "managedKey" and
  // "timelineHeight" (as a 32-bit float). Title and observable paths are
  // not kept; the object supplies the title again when it lists its tracks.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  // Adds an edit at a and at b unless a control point is there already,
  // then finds the two points' indices; false when there is nothing
  // between them to take out (a bound in no span).
  bool controlPointsAt(float a, float b, int& ia, int& ib);
  // Removes the elements between the points at ia and ib but the last.
  void removeBetween(int ia, int ib);

  ClipList sequencedClips_;
  std::int32_t fpsTimes100_ = 2500;
  std::weak_ptr<Object> theObject_;
  std::string managedKey_;
  std::string title_;
  std::set<std::string> observablePaths_;
  bool isSelectedForEditing_ = false;
  double timelineHeight_ = 26.0;
};

// The ruler at the top of the timeline: 16 pixels high, neither editable
// nor removable, and it drives nothing.
class TimecodeTrack : public TimelineTrack {
 public:
  std::string_view className() const override { return "TimecodeTrack"; }
  double timelineHeight() const override { return 16.0; }
  bool isEditable() const override { return false; }
  bool canRemove() const override { return false; }
  void applyEffectForTime(float) override {}
};

}  // namespace cloudreel
