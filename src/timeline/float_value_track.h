#pragma once
// A track that drives one float property of its object: at each time the
// value of the span there (or the track's default value where no span
// covers the time) is set through the object's key-value coding, so the
// object's observers and the document's undo see an ordinary change.

#include <memory>
#include <string>
#include <string_view>

#include "timeline/timeline_track.h"

namespace cloudreel {

class FloatValueTrack : public TimelineTrack {
 public:
  FloatValueTrack() = default;
  // The default value is the object's current value of the key (0 when the
  // object has no number there).
  FloatValueTrack(const ObjectPtr& object, std::string keyPath, std::string title);

  std::string_view className() const override { return "FloatValueTrack"; }
  const PropertyTable& properties() const override;

  float defaultValue() const { return defaultValue_; }
  void setDefaultValue(float v) { changeValueForKey("defaultValue", defaultValue_, v); }

  // A control point holding the default value at t, a ramp from the
  // default value to itself over d seconds, and a control point at t + d.
  void addDefaultClipAtTime(float t, float d) override;
  // The span's value at t, or the default value before the first span, in
  // gaps, from the end of the last span on and on an empty track.
  void applyEffectForTime(float t) override;
  // Copies the control point's value into the end of the span before it and
  // the start of the span after it.
  void applyControlPointChange(TimelineClip& controlPoint) override;
  // While a control point is edited its clip observes the animated
  // property, taking each new value.
  void beginObservingObjectForEdit(EditPoint& edit) override;
  void endObservingObjectForEdit(EditPoint& edit) override;

  // After the track keys, "defaultValue" (float).
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  float defaultValue_ = 0.0f;
};

}  // namespace cloudreel
