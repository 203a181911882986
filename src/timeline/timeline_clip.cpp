#include "timeline/timeline_clip.h"

#include <cmath>
#include <limits>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "timeline/spline.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

// A clip of zero duration maps its time through ct / 0: IEEE arithmetic
// makes that an infinity or a NaN, which the formulas carry on without a
// trap. Such clips only arise as the zero-length copies a ripple insert
// leaves, which no lookup answers.
static_assert(std::numeric_limits<float>::is_iec559, "clip arithmetic relies on IEEE floats");

TimelineClip::TimelineClip() : spline_(std::make_shared<Spline>()) {}

TimelineClip::TimelineClip(float begin, float duration)
    : begin_(begin), duration_(duration), spline_(std::make_shared<Spline>()) {}

std::shared_ptr<TimelineClip> TimelineClip::controlPointWithTime(float t) {
  auto clip = std::make_shared<TimelineClip>(t, 0.0f);
  clip->markAsControlPoint();
  return clip;
}

const PropertyTable& TimelineClip::properties() const {
  using C = TimelineClip;
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<C>("begin", &C::begin, &C::setBegin),
       property<C>("duration", &C::duration, &C::setDuration),
       readOnlyProperty<C>("isControlPoint", &C::isControlPoint),
       property<C>("isEditing", &C::isEditing, &C::setIsEditing),
       property<C>("fps", &C::fps, &C::setFps), property<C>("tBegin", &C::tBegin, &C::setTBegin),
       property<C>("tEnd", &C::tEnd, &C::setTEnd),
       notifyingProperty<C>("rampType", &C::rampType, &C::setRampType),
       property<C>("spline", &C::spline, &C::setSpline)});
  return table;
}

std::shared_ptr<TimelineClip> TimelineClip::copy() const {
  std::shared_ptr<TimelineClip> clip = makeBlank();
  copyInto(*clip);
  return clip;
}

std::shared_ptr<TimelineClip> TimelineClip::makeBlank() const {
  return std::make_shared<TimelineClip>();
}

void TimelineClip::copyInto(TimelineClip& target) const {
  target.begin_ = begin_;
  target.duration_ = duration_;
  target.rampType_ = rampType_;
  target.fps_ = fps_;
  target.tBegin_ = tBegin_;
  target.tEnd_ = tEnd_;
  target.spline_ = spline_->copy();
}

void TimelineClip::setRampType(std::int32_t n) {
  // Taken as unsigned, a negative number is huge: one comparison refuses both.
  if (static_cast<std::uint32_t>(n) < static_cast<std::uint32_t>(kRampTypeCount)) {
    changeValueForKey("rampType", rampType_, n);
  }
}

void TimelineClip::setSpline(std::shared_ptr<Spline> spline) {
  changeValueForKey("spline", spline_, spline ? std::move(spline) : std::make_shared<Spline>());
}

float TimelineClip::floatValueForSequenceTime(float) const { return 0.0f; }

ObjectPtr TimelineClip::objectValueForSequenceTime(float) const { return nullptr; }

float TimelineClip::tValueForClipTime(float ct) const { return ct / duration_ * tEnd_ + tBegin_; }

float TimelineClip::rampValueForClipTime(float ct, float c) const {
  const float u = tValueForClipTime(ct);
  switch (rampType_) {
    case static_cast<std::int32_t>(RampType::Linear):
      return u * c;
    case static_cast<std::int32_t>(RampType::EaseIn):
      return c * u * u;
    case static_cast<std::int32_t>(RampType::EaseOut):
      return -(c * u) * (u - 2.0f);
    case static_cast<std::int32_t>(RampType::EaseInOut): {
      const float w = 2.0f * u;
      if (w < 1.0f) {
        return (c * 0.5f) * w * w;
      }
      const float v = w - 1.0f;
      return ((v - 2.0f) * v - 1.0f) * (c * -0.5f);
    }
    case static_cast<std::int32_t>(RampType::CustomSpline):
      return spline_->valueForTime(u) * c;
    default:
      return 0.0f;
  }
}

void TimelineClip::highlightFrameForTime(float) {}

bool TimelineClip::isControlPointAtTime(float t) const {
  // The difference is taken in single precision, the comparison in double.
  return isControlPoint_ && static_cast<double>(std::fabs(begin_ - t)) < 0.00001;
}

bool TimelineClip::isControlPointWithin(float d, float t) const {
  return isControlPoint_ && std::fabs(begin_ - t) < d;
}

int TimelineClip::indexInTrack(const TimelineTrack& track) const { return track.indexOfClip(this); }

std::shared_ptr<TimelineClip> TimelineClip::splitClipInSequence(TimelineTrack&, float) {
  return nullptr;
}

std::shared_ptr<TimelineClip> TimelineClip::finishSplit(TimelineTrack& track, int k, float t,
                                                        std::shared_ptr<TimelineClip> span,
                                                        std::shared_ptr<TimelineClip> point) {
  setDuration(t - begin_);
  auto& clips = track.mutableSequencedClips();
  clips.insert(clips.begin() + k + 1, point);
  clips.insert(clips.begin() + k + 2, std::move(span));
  return point;
}

void TimelineClip::observeChangeForEdit(const Change&, EditPoint&) {
  logf("Base class Notification observation changed!");
}

void TimelineClip::observeValueForKeyPathOfObjectChangeContext(std::string_view, Object& object,
                                                               const Change&, std::string_view) {
  logf("Base class Observation changed for object %s", object.className());
}

void TimelineClip::addItemsToMenu(Menu& menu, Timeline*, TimelineTrack*, MyDocument*) {
  const ObjectPtr self = weak_from_this().lock();
  menu.addSeparator();
  menu.addItem("Edit In Point", "editInPoint:", self);
  menu.addItem("Edit Out Point", {}, self);
  menu.addItem("Add cut here", {}, self);
  menu.addItem("Edit Spline", "editSpline:", self);

  auto ramps = std::make_shared<Menu>();
  ramps->title = "Ramps";
  static constexpr const char* kTitles[kRampTypeCount] = {"Linear", "Ease-in Quadratic",
                                                          "Ease-out Quadratic",
                                                          "Ease-in&out Quadratic", "Custom spline"};
  const std::weak_ptr<Object> target = weak_from_this();
  for (std::int32_t tag = 0; tag < kRampTypeCount; ++tag) {
    MenuItem& item = ramps->addItem(kTitles[tag], "menuRampType:");
    item.tag = tag;
    item.isChecked = tag == rampType_;
    // The item may outlive the clip (a menu left open while the track is
    // edited); a clip that is gone ignores the choice.
    item.perform = [target](const MenuItem& chosen) {
      if (auto clip = std::static_pointer_cast<TimelineClip>(target.lock())) {
        clip->menuRampType(chosen);
      }
    };
  }
  menu.addItem("Time ramp").submenu = std::move(ramps);
}

Color TimelineClip::defaultColor() const { return Color(0.55f, 0.65f, 0.85f); }

std::string TimelineClip::description() const {
  return fmt::sprintf("%s %0.2f+%0.2f", className(), begin_, duration_);
}

void TimelineClip::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeFloat(duration_, "duration");
  coder.encodeFloat(begin_, "begin");
  coder.encodeInt32(rampType_, "rampType");
  coder.encodeBool(isControlPoint_, "isControlPoint");
  coder.encodeFloat(tBegin_, "tBegin");
  coder.encodeFloat(tEnd_, "tEnd");
  coder.encodeObject(spline_, "spline");
}

void TimelineClip::initWithCoder(KeyedUnarchiver& coder) {
  duration_ = coder.decodeFloatForKey("duration");
  begin_ = coder.decodeFloatForKey("begin");
  // A stored ramp number outside 0..4 is kept: it evaluates to 0, as an
  // unknown ramp does, and the menu shows no ramp checked.
  rampType_ = coder.decodeInt32ForKey("rampType");
  isControlPoint_ = coder.decodeBoolForKey("isControlPoint");
  tBegin_ = coder.decodeFloatForKey("tBegin");
  tEnd_ = coder.decodeFloatForKey("tEnd");
  spline_ = coder.decodeObjectOfClassForKey<Spline>("spline");
  if (!spline_) {
    spline_ = std::make_shared<Spline>();
  }
}

}  // namespace cloudreel
