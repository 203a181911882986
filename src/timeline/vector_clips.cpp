#include "timeline/vector_clips.h"

#include <fmt/printf.h>

#include "geometry/rotations.h"
#include "geometry/vector3.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "timeline/edit_point.h"
#include "timeline/menu_description.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

namespace {

std::shared_ptr<Vector3> copyOf(const std::shared_ptr<Vector3>& v) {
  return v ? v->copy() : nullptr;
}

std::string describe(const std::shared_ptr<Vector3>& v) {
  return v ? v->description() : std::string("(null)");
}

}  // namespace

// --- TweenClip

TweenClip::TweenClip(float begin, float duration, const Vector3& valueAtStart,
                     const Vector3& valueAtEnd)
    : TimelineClip(begin, duration),
      valueBegin_(valueAtStart.copy()),
      valueEnd_(valueAtEnd.copy()) {}

const PropertyTable& TweenClip::properties() const {
  using C = TweenClip;
  static const PropertyTable table(&TimelineClip::properties(),
                                   {property<C>("valueBegin", &C::valueBegin, &C::setValueBegin),
                                    property<C>("valueEnd", &C::valueEnd, &C::setValueEnd)});
  return table;
}

std::shared_ptr<TimelineClip> TweenClip::makeBlank() const { return std::make_shared<TweenClip>(); }

void TweenClip::setValueBegin(std::shared_ptr<Vector3> v) {
  changeValueForKey("valueBegin", valueBegin_, copyOf(v));
}

void TweenClip::setValueEnd(std::shared_ptr<Vector3> v) {
  changeValueForKey("valueEnd", valueEnd_, copyOf(v));
}

ObjectPtr TweenClip::objectValueForSequenceTime(float t) const {
  if (!valueBegin_ || !valueEnd_) {
    return nullptr;
  }
  const double r = rampValueForClipTime(t - begin(), 1.0f);
  const Vector3& a = *valueBegin_;
  const Vector3& b = *valueEnd_;
  return Vector3::vectorWithXYZ(a.x() + (b.x() - a.x()) * r, a.y() + (b.y() - a.y()) * r,
                                a.z() + (b.z() - a.z()) * r);
}

void TweenClip::logSplit(const TimelineTrack& track, float t) const {
  logf("split tween in seq %s at time %f", track.description(), t);
}

std::shared_ptr<TimelineClip> TweenClip::splitClipInSequence(TimelineTrack& track, float t) {
  const int k = indexInTrack(track);
  if (k < 0) {
    return nullptr;
  }
  logSplit(track, t);
  const float rest = duration() - (t - begin());
  const auto v = objectAs<Vector3>(objectValueForSequenceTime(t));
  // A blank clip of the receiver's own kind, so a rotation tween splits
  // into rotation tweens.
  auto span = std::static_pointer_cast<TweenClip>(makeBlank());
  span->setBegin(t);
  span->setDuration(rest);
  span->setValueEnd(valueEnd_);
  setValueEnd(v);
  span->setValueBegin(v);
  // A tween missing an end has no value at t: its new control point holds
  // the zero vector a Vector3Clip starts with.
  const Vector3 zero;
  auto point = Vector3Clip::controlPointWithTime(t, v ? *v : zero);
  return finishSplit(track, k, t, std::move(span), std::move(point));
}

std::string TweenClip::description() const {
  return fmt::sprintf("from %s to %s", describe(valueBegin_), describe(valueEnd_));
}

void TweenClip::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineClip::encodeWithCoder(coder);
  coder.encodeObject(valueBegin_, "valueBegin");
  coder.encodeObject(valueEnd_, "valueEnd");
}

void TweenClip::initWithCoder(KeyedUnarchiver& coder) {
  TimelineClip::initWithCoder(coder);
  valueBegin_ = coder.decodeObjectOfClassForKey<Vector3>("valueBegin");
  valueEnd_ = coder.decodeObjectOfClassForKey<Vector3>("valueEnd");
}

// --- SlerpClip

std::shared_ptr<TimelineClip> SlerpClip::makeBlank() const { return std::make_shared<SlerpClip>(); }

ObjectPtr SlerpClip::objectValueForSequenceTime(float t) const {
  if (!valueBegin() || !valueEnd()) {
    return nullptr;
  }
  const double r = rampValueForClipTime(t - begin(), 1.0f);
  Quaternion from{};
  Quaternion to{};
  Quaternion out{};
  eulerToQuaternion(from, valueBegin()->x(), valueBegin()->y(), valueBegin()->z());
  eulerToQuaternion(to, valueEnd()->x(), valueEnd()->y(), valueEnd()->z());
  slerpQuaternion(from, to, out, r);
  EulerAngles angles{};
  quaternionToEuler(out, angles);
  return Vector3::vectorWithFloats(angles);
}

void SlerpClip::addItemsToMenu(Menu& menu, Timeline* timeline, TimelineTrack* track,
                               MyDocument* document) {
  auto slerp = std::make_shared<Menu>();
  slerp->title = "slerp";
  MenuItem& test = slerp->addItem("Slerp", "menuTest:");
  test.perform = [](const MenuItem& sender) { logf("menu selected sender %s", sender.title); };
  auto paths = std::make_shared<Menu>();
  paths->title = "paths";
  slerp->addItem("Path").submenu = std::move(paths);
  menu.addItem("Slerp").submenu = std::move(slerp);
  TweenClip::addItemsToMenu(menu, timeline, track, document);
}

void SlerpClip::logSplit(const TimelineTrack& track, float t) const {
  logf("split slerp in seq %s at time %f", track.description(), t);
}

std::string SlerpClip::description() const {
  return fmt::sprintf("SLERP from %s to %s", describe(valueBegin()), describe(valueEnd()));
}

// --- Vector3Clip

Vector3Clip::Vector3Clip() : value_(Vector3::zeroVector()) {}

Vector3Clip::Vector3Clip(float begin, float duration)
    : TimelineClip(begin, duration), value_(Vector3::zeroVector()) {}

std::shared_ptr<Vector3Clip> Vector3Clip::controlPointWithTime(float t, const Vector3& v) {
  auto clip = std::make_shared<Vector3Clip>(t, 0.0f);
  clip->markAsControlPoint();
  clip->value_ = v.copy();
  return clip;
}

const PropertyTable& Vector3Clip::properties() const {
  using C = Vector3Clip;
  static const PropertyTable table(&TimelineClip::properties(),
                                   {property<C>("value", &C::value, &C::setValue)});
  return table;
}

std::shared_ptr<TimelineClip> Vector3Clip::makeBlank() const {
  return std::make_shared<Vector3Clip>();
}

void Vector3Clip::copyInto(TimelineClip& target) const {
  TimelineClip::copyInto(target);
  static_cast<Vector3Clip&>(target).value_ = value_->copy();
}

void Vector3Clip::setValue(std::shared_ptr<Vector3> v) {
  changeValueForKey("value", value_, v ? v->copy() : Vector3::zeroVector());
}

ObjectPtr Vector3Clip::objectValueForSequenceTime(float) const { return value_->copy(); }

void Vector3Clip::takeValueOf(const Object& object, std::string_view keyPath) {
  // A key that holds no vector leaves the value as it was.
  if (auto v = objectAs<Vector3>(object.valueForKeyPath(keyPath))) {
    setValue(std::move(v));
  }
}

void Vector3Clip::observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath,
                                                              Object& object, const Change&,
                                                              std::string_view) {
  takeValueOf(object, keyPath);
}

void Vector3Clip::observeChangeForEdit(const Change&, EditPoint& edit) {
  const auto track = edit.track();
  if (!track) {
    return;
  }
  if (const auto object = track->theObject()) {
    takeValueOf(*object, track->managedKey());
  }
}

std::string Vector3Clip::description() const { return value_->description(); }

void Vector3Clip::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineClip::encodeWithCoder(coder);
  coder.encodeObject(value_, "value");
}

void Vector3Clip::initWithCoder(KeyedUnarchiver& coder) {
  TimelineClip::initWithCoder(coder);
  value_ = coder.decodeObjectOfClassForKey<Vector3>("value");
  if (!value_) {
    value_ = Vector3::zeroVector();
  }
}

}  // namespace cloudreel
