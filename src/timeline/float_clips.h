#pragma once
// The clips of a float-valued track: a constant (the control points, which
// carry the value at a boundary) and a ramp from one value to another (the
// spans between them).

#include <memory>
#include <string>
#include <string_view>

#include "timeline/timeline_clip.h"

namespace cloudreel {

class SingleValueClip : public TimelineClip {
 public:
  SingleValueClip() = default;
  SingleValueClip(float begin, float duration) : TimelineClip(begin, duration) {}
  // A control point at t holding the value v.
  static std::shared_ptr<SingleValueClip> controlPointWithTime(float t, float v);

  std::string_view className() const override { return "SingleValueClip"; }
  const PropertyTable& properties() const override;

  float value() const { return value_; }
  void setValue(float v) { changeValueForKey("value", value_, v); }

  float floatValueForSequenceTime(float t) const override;
  // While its control point is edited the clip observes the animated
  // property and takes each new value.
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;
  void observeChangeForEdit(const Change& change, EditPoint& edit) override;
  std::string description() const override;

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;

 private:
  void takeNewValue(const Change& change);

  float value_ = 0.0f;
};

class AnimatedValueClip : public TimelineClip {
 public:
  AnimatedValueClip() = default;
  AnimatedValueClip(float begin, float duration, float valueAtStart, float valueAtEnd)
      : TimelineClip(begin, duration), valueBegin_(valueAtStart), valueEnd_(valueAtEnd) {}

  std::string_view className() const override { return "AnimatedValueClip"; }
  const PropertyTable& properties() const override;

  float valueBegin() const { return valueBegin_; }
  float valueEnd() const { return valueEnd_; }
  void setValueBegin(float v) { changeValueForKey("valueBegin", valueBegin_, v); }
  void setValueEnd(float v) { changeValueForKey("valueEnd", valueEnd_, v); }

  // valueBegin plus the ramp scaled to the change from valueBegin to valueEnd.
  float floatValueForSequenceTime(float t) const override;
  // The new half starts with the default ramp, so a split keeps the value
  // continuous at t but not an eased curve's shape.
  std::shared_ptr<TimelineClip> splitClipInSequence(TimelineTrack& track, float t) override;
  std::string description() const override;

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;

 private:
  float valueBegin_ = 0.0f;
  float valueEnd_ = 0.0f;
};

}  // namespace cloudreel
