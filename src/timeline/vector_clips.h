#pragma once
// The clips of a vector-valued track: a tween from one vector to another, a
// rotation tween that interpolates Euler angles through quaternions, and the
// constant vector of their control points. Every vector a clip is given or
// hands out is its own copy.

#include <memory>
#include <string>
#include <string_view>

#include "timeline/timeline_clip.h"

namespace cloudreel {

class Vector3;

class TweenClip : public TimelineClip {
 public:
  // No vectors: a blank tween answers null until it is given both.
  TweenClip() = default;
  TweenClip(float begin, float duration, const Vector3& valueAtStart, const Vector3& valueAtEnd);

  std::string_view className() const override { return "TweenClip"; }
  const PropertyTable& properties() const override;

  const std::shared_ptr<Vector3>& valueBegin() const { return valueBegin_; }
  const std::shared_ptr<Vector3>& valueEnd() const { return valueEnd_; }
  // Store copies.
  void setValueBegin(std::shared_ptr<Vector3> v);
  void setValueEnd(std::shared_ptr<Vector3> v);

  // A new vector, each component start + (end - start) · r in double, r the
  // ramp normalised to 1; null while either end is missing.
  ObjectPtr objectValueForSequenceTime(float t) const override;
  std::shared_ptr<TimelineClip> splitClipInSequence(TimelineTrack& track, float t) override;
  std::string description() const override;

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;
  // The log line of a split, with the track and the time.
  virtual void logSplit(const TimelineTrack& track, float t) const;

 private:
  std::shared_ptr<Vector3> valueBegin_;
  std::shared_ptr<Vector3> valueEnd_;
};

class SlerpClip : public TweenClip {
 public:
  SlerpClip() = default;
  SlerpClip(float begin, float duration, const Vector3& valueAtStart, const Vector3& valueAtEnd)
      : TweenClip(begin, duration, valueAtStart, valueAtEnd) {}

  std::string_view className() const override { return "SlerpClip"; }

  // The ends are Euler angles (degrees); their quaternions are interpolated
  // spherically at r and the result turned back into angles.
  ObjectPtr objectValueForSequenceTime(float t) const override;
  // A "Slerp" submenu first, then the clip items.
  void addItemsToMenu(Menu& menu, Timeline* timeline, TimelineTrack* track,
                      MyDocument* document) override;
  std::string description() const override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;
  void logSplit(const TimelineTrack& track, float t) const override;
};

class Vector3Clip : public TimelineClip {
 public:
  // Holds a zero vector.
  Vector3Clip();
  Vector3Clip(float begin, float duration);
  static std::shared_ptr<Vector3Clip> controlPointWithTime(float t, const Vector3& v);

  std::string_view className() const override { return "Vector3Clip"; }
  const PropertyTable& properties() const override;

  const std::shared_ptr<Vector3>& value() const { return value_; }
  // Stores a copy; null stores a zero vector.
  void setValue(std::shared_ptr<Vector3> v);

  ObjectPtr objectValueForSequenceTime(float t) const override;
  // Both take the edited object's current vector for the observed key.
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;
  void observeChangeForEdit(const Change& change, EditPoint& edit) override;
  std::string description() const override;

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;
  void copyInto(TimelineClip& target) const override;

 private:
  void takeValueOf(const Object& object, std::string_view keyPath);

  std::shared_ptr<Vector3> value_;
};

}  // namespace cloudreel
