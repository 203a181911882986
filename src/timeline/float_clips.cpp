#include "timeline/float_clips.h"

#include <fmt/printf.h>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

// --- SingleValueClip

std::shared_ptr<SingleValueClip> SingleValueClip::controlPointWithTime(float t, float v) {
  auto clip = std::make_shared<SingleValueClip>(t, 0.0f);
  clip->markAsControlPoint();
  clip->value_ = v;
  return clip;
}

const PropertyTable& SingleValueClip::properties() const {
  using C = SingleValueClip;
  static const PropertyTable table(&TimelineClip::properties(),
                                   {property<C>("value", &C::value, &C::setValue)});
  return table;
}

std::shared_ptr<TimelineClip> SingleValueClip::makeBlank() const {
  return std::make_shared<SingleValueClip>();
}

float SingleValueClip::floatValueForSequenceTime(float) const { return value_; }

void SingleValueClip::takeNewValue(const Change& change) {
  if (change.newValue) {
    if (auto v = numberAs<float>(*change.newValue)) {
      setValue(*v);
    }
  }
}

void SingleValueClip::observeValueForKeyPathOfObjectChangeContext(std::string_view, Object&,
                                                                  const Change& change,
                                                                  std::string_view) {
  takeNewValue(change);
}

void SingleValueClip::observeChangeForEdit(const Change& change, EditPoint&) {
  takeNewValue(change);
}

std::string SingleValueClip::description() const { return fmt::sprintf("%f", value_); }

void SingleValueClip::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineClip::encodeWithCoder(coder);
  coder.encodeFloat(value_, "value");
}

void SingleValueClip::initWithCoder(KeyedUnarchiver& coder) {
  TimelineClip::initWithCoder(coder);
  value_ = coder.decodeFloatForKey("value");
}

// --- AnimatedValueClip

const PropertyTable& AnimatedValueClip::properties() const {
  using C = AnimatedValueClip;
  static const PropertyTable table(&TimelineClip::properties(),
                                   {property<C>("valueBegin", &C::valueBegin, &C::setValueBegin),
                                    property<C>("valueEnd", &C::valueEnd, &C::setValueEnd)});
  return table;
}

std::shared_ptr<TimelineClip> AnimatedValueClip::makeBlank() const {
  return std::make_shared<AnimatedValueClip>();
}

float AnimatedValueClip::floatValueForSequenceTime(float t) const {
  return valueBegin_ + rampValueForClipTime(t - begin(), valueEnd_ - valueBegin_);
}

std::shared_ptr<TimelineClip> AnimatedValueClip::splitClipInSequence(TimelineTrack& track,
                                                                     float t) {
  const int k = indexInTrack(track);
  if (k < 0) {
    return nullptr;
  }
  const float rest = duration() - (t - begin());
  const float v = floatValueForSequenceTime(t);
  auto span = std::make_shared<AnimatedValueClip>(t, rest, v, valueEnd_);
  auto point = SingleValueClip::controlPointWithTime(t, v);
  setValueEnd(v);
  return finishSplit(track, k, t, std::move(span), std::move(point));
}

std::string AnimatedValueClip::description() const {
  return fmt::sprintf("from %f to %f", valueBegin_, valueEnd_);
}

void AnimatedValueClip::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineClip::encodeWithCoder(coder);
  coder.encodeFloat(valueBegin_, "valueBegin");
  coder.encodeFloat(valueEnd_, "valueEnd");
}

void AnimatedValueClip::initWithCoder(KeyedUnarchiver& coder) {
  TimelineClip::initWithCoder(coder);
  valueBegin_ = coder.decodeFloatForKey("valueBegin");
  valueEnd_ = coder.decodeFloatForKey("valueEnd");
}

}  // namespace cloudreel
