#pragma once
// One span of a track: it covers the sequence times from `begin` for
// `duration` seconds and yields the animated value there, after mapping the
// time through its ramp. A control point is a zero-length clip that marks
// the boundary between two spans and carries the value there.
//
// The kinds of value (a float, a float ramp, a vector tween, a rotation
// tween, a transform from a camera path) are the subclasses; this class
// holds the timing, the ramp and what every clip shares. Times are seconds
// in 32-bit floats, and the ramp arithmetic is single precision throughout,
// as the stored values are.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "platform/color.h"
#include "platform/object.h"
#include "timeline/menu_description.h"

namespace cloudreel {

class EditPoint;
class MyDocument;
class Spline;
class Timeline;
class TimelineTrack;

// The time ramps a clip can use, by their menu order and stored number.
enum class RampType : std::int32_t {
  Linear = 0,
  EaseIn = 1,
  EaseOut = 2,
  EaseInOut = 3,
  CustomSpline = 4,
};
inline constexpr std::int32_t kRampTypeCount = 5;

class TimelineClip : public Object, public Observer {
 public:
  // A plain clip of no length at 0; the archive and the copy start from it.
  TimelineClip();
  TimelineClip(float begin, float duration);
  // A control point at t: no duration, isControlPoint set.
  static std::shared_ptr<TimelineClip> controlPointWithTime(float t);

  std::string_view className() const override { return "TimelineClip"; }
  const PropertyTable& properties() const override;

  // A new clip of the same class with the timing, ramp, frame rate and a
  // copy of the spline (whose points the copy shares). The control-point
  // and editing flags are not carried, so the copy of a control point is an
  // ordinary zero-length clip; most kinds do not carry their values either.
  // Ripple insertion relies on exactly this.
  std::shared_ptr<TimelineClip> copy() const;

  float begin() const { return begin_; }
  float duration() const { return duration_; }
  float end() const { return begin_ + duration_; }
  bool isControlPoint() const { return isControlPoint_; }
  bool isEditing() const { return isEditing_; }
  std::int32_t fps() const { return fps_; }
  float tBegin() const { return tBegin_; }
  float tEnd() const { return tEnd_; }
  std::int32_t rampType() const { return rampType_; }
  const std::shared_ptr<Spline>& spline() const { return spline_; }

  void setBegin(float v) { changeValueForKey("begin", begin_, v); }
  void setDuration(float v) { changeValueForKey("duration", duration_, v); }
  void setIsEditing(bool v) { changeValueForKey("isEditing", isEditing_, v); }
  void setFps(std::int32_t v) { changeValueForKey("fps", fps_, v); }
  void setTBegin(float v) { changeValueForKey("tBegin", tBegin_, v); }
  void setTEnd(float v) { changeValueForKey("tEnd", tEnd_, v); }
  // Only 0 to 4 are ramps; any other number (negative ones included) is
  // ignored and the ramp stays as it was.
  void setRampType(std::int32_t n);
  // A null spline is replaced by a new default one.
  void setSpline(std::shared_ptr<Spline> spline);
  void adjustBeginTime(float dt) { setBegin(begin_ + dt); }

  // --- values
  virtual float floatValueForSequenceTime(float t) const;
  virtual ObjectPtr objectValueForSequenceTime(float t) const;
  float clipTimeForSequenceTime(float t) const { return t - begin_; }
  // ct / duration · tEnd + tBegin: tEnd scales, tBegin offsets.
  float tValueForClipTime(float ct) const;
  // The ramp at clip time ct scaled to c (see the .cpp for the five shapes).
  // u is not clamped, so times outside the clip extrapolate.
  float rampValueForClipTime(float ct, float c) const;
  // Lets a path-driven clip mark the frame it is showing; nothing here.
  virtual void highlightFrameForTime(float t);

  // --- hit tests
  // Half-open: begin <= t < end; never true for a control point. Inline:
  // every application of a track scans its list with it.
  bool intersectsWithTime(float t) const {
    return !isControlPoint_ && begin_ <= t && t < begin_ + duration_;
  }
  // A control point within 0.00001 s of t.
  bool isControlPointAtTime(float t) const;
  bool isControlPointWithin(float d, float t) const;

  // --- splitting
  // Cuts this clip at t inside the track: the clip ends at t, a new control
  // point at t and a new clip from t to the old end follow it in the track's
  // list, and the control point is answered. Kinds that cannot split (plain
  // filler clips, control points) answer null and change nothing; so does a
  // clip that is not in the track's list.
  virtual std::shared_ptr<TimelineClip> splitClipInSequence(TimelineTrack& track, float t);

  // --- editing a control point's value
  // A change of the edited property, passed on by the edit point.
  virtual void observeChangeForEdit(const Change& change, EditPoint& edit);
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;

  // --- context menu
  // Appends the clip's items: the edit commands (carried out by the
  // timeline window) and the "Time ramp" submenu, whose items set the ramp.
  virtual void addItemsToMenu(Menu& menu, Timeline* timeline, TimelineTrack* track,
                              MyDocument* document);
  void menuRampType(const MenuItem& item) { setRampType(item.tag); }

  // The fill of the clip's box in the timeline.
  virtual Color defaultColor() const;
  virtual std::string description() const;

  // "duration", "begin", "rampType", "isControlPoint", "tBegin", "tEnd",
  // "spline" in that order; subclasses add theirs after. A missing spline
  // reads as a new default one.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  // A blank clip of the receiver's class, for copy().
  virtual std::shared_ptr<TimelineClip> makeBlank() const;
  // Copies what the class's copy carries; subclasses call the base first.
  virtual void copyInto(TimelineClip& target) const;
  // The receiver's index in the track's list; -1 when it is not there.
  int indexInTrack(const TimelineTrack& track) const;
  // The last steps every split shares, once the kind has made its new span
  // and control point and moved its values: the receiver, at index k of the
  // track, ends at t; the point goes in at k + 1 and the span at k + 2.
  std::shared_ptr<TimelineClip> finishSplit(TimelineTrack& track, int k, float t,
                                            std::shared_ptr<TimelineClip> span,
                                            std::shared_ptr<TimelineClip> point);
  void markAsControlPoint() { isControlPoint_ = true; }

 private:
  float begin_ = 0.0f;
  float duration_ = 0.0f;
  bool isControlPoint_ = false;
  bool isEditing_ = false;
  std::int32_t fps_ = 25;
  float tBegin_ = 0.0f;
  float tEnd_ = 1.0f;
  std::int32_t rampType_ = 0;
  std::shared_ptr<Spline> spline_;
};

}  // namespace cloudreel
