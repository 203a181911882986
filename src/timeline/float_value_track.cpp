#include "timeline/float_value_track.h"

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "timeline/edit_point.h"
#include "timeline/float_clips.h"

namespace cloudreel {

FloatValueTrack::FloatValueTrack(const ObjectPtr& object, std::string keyPath, std::string title)
    : TimelineTrack(object, std::move(keyPath), std::move(title)) {
  if (object) {
    defaultValue_ = numberAs<float>(object->valueForKeyPath(managedKey())).value_or(0.0f);
  }
}

const PropertyTable& FloatValueTrack::properties() const {
  using T = FloatValueTrack;
  static const PropertyTable table(
      &TimelineTrack::properties(),
      {property<T>("defaultValue", &T::defaultValue, &T::setDefaultValue)});
  return table;
}

void FloatValueTrack::addDefaultClipAtTime(float t, float d) {
  justAddClip(SingleValueClip::controlPointWithTime(t, defaultValue_));
  justAddClip(std::make_shared<AnimatedValueClip>(t, d, defaultValue_, defaultValue_));
  justAddClip(SingleValueClip::controlPointWithTime(t + d, defaultValue_));
}

void FloatValueTrack::applyEffectForTime(float t) {
  const ObjectPtr object = theObject();
  if (!object) {
    return;
  }
  const auto clip = clipForTime(t);
  const float value = clip ? clip->floatValueForSequenceTime(t) : defaultValue_;
  object->setValueForKeyPath(value, managedKey());
}

void FloatValueTrack::applyControlPointChange(TimelineClip& controlPoint) {
  const auto* point = dynamic_cast<const SingleValueClip*>(&controlPoint);
  const int i = indexOfClip(&controlPoint);
  if (!point || i < 0) {
    return;
  }
  const auto& clips = sequencedClips();
  const auto index = static_cast<std::size_t>(i);
  // Only ramps have ends to reshape; a filler beside the point is left.
  if (index > 0 && !clips[index - 1]->isControlPoint()) {
    if (auto* before = dynamic_cast<AnimatedValueClip*>(clips[index - 1].get())) {
      before->setValueEnd(point->value());
    }
  }
  if (index + 1 < clips.size() && !clips[index + 1]->isControlPoint()) {
    if (auto* after = dynamic_cast<AnimatedValueClip*>(clips[index + 1].get())) {
      after->setValueBegin(point->value());
    }
  }
}

void FloatValueTrack::beginObservingObjectForEdit(EditPoint& edit) {
  const auto clip = edit.clip();
  const ObjectPtr object = theObject();
  if (clip && object) {
    object->addObserver(*clip, managedKey(), ObservingOptions::New, "");
  }
}

void FloatValueTrack::endObservingObjectForEdit(EditPoint& edit) {
  const auto clip = edit.clip();
  const ObjectPtr object = theObject();
  if (clip && object) {
    object->removeObserver(*clip, managedKey());
  }
}

void FloatValueTrack::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineTrack::encodeWithCoder(coder);
  coder.encodeFloat(defaultValue_, "defaultValue");
}

void FloatValueTrack::initWithCoder(KeyedUnarchiver& coder) {
  TimelineTrack::initWithCoder(coder);
  defaultValue_ = coder.decodeFloatForKey("defaultValue");
}

}  // namespace cloudreel
