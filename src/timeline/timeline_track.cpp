#include "timeline/timeline_track.h"

#include <fmt/format.h>
#include <fmt/printf.h>

#include <algorithm>
#include <cmath>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "scene/layer.h"
#include "timeline/menu_description.h"
#include "timeline/timeline_clip.h"

namespace cloudreel {

namespace {

// A boxed value as a panel shows it: numbers in their shortest form, a
// string as it is, an object by its class.
std::string describeValue(const Value& value) {
  return std::visit(
      [](const auto& v) -> std::string {
        using T = std::decay_t<decltype(v)>;
        if constexpr (std::is_same_v<T, std::monostate>) {
          return "(null)";
        } else if constexpr (std::is_same_v<T, bool>) {
          return v ? "1" : "0";
        } else if constexpr (std::is_same_v<T, std::string>) {
          return v;
        } else if constexpr (std::is_same_v<T, ObjectPtr>) {
          return v ? std::string(v->className()) : std::string("(null)");
        } else {
          return fmt::format("{}", v);
        }
      },
      value);
}

}  // namespace

TimelineTrack::TimelineTrack() = default;

TimelineTrack::TimelineTrack(const ObjectPtr& object, std::string keyPath, std::string title)
    : theObject_(object), managedKey_(std::move(keyPath)), title_(std::move(title)) {}

TimelineTrack::TimelineTrack(const ObjectPtr& object, std::string keyPath,
                             std::set<std::string> observablePaths)
    : theObject_(object),
      managedKey_(std::move(keyPath)),
      observablePaths_(std::move(observablePaths)) {}

const PropertyTable& TimelineTrack::properties() const {
  using T = TimelineTrack;
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<T>("title", &T::title, &T::setTitle),
       readOnlyProperty<T>("managedKey", &T::managedKey),
       property<T>("isSelectedForEditing", &T::isSelectedForEditing, &T::setIsSelectedForEditing),
       property<T>("timelineHeight", &T::timelineHeight, &T::setTimelineHeight),
       property<T>("fps_times_100", &T::fpsTimes100, &T::setFpsTimes100),
       readOnlyProperty<T>("isEditable", &T::isEditable),
       readOnlyProperty<T>("canRemove", &T::canRemove)});
  return table;
}

int TimelineTrack::indexOfClip(const TimelineClip* clip) const {
  for (std::size_t i = 0; i < sequencedClips_.size(); ++i) {
    if (sequencedClips_[i].get() == clip) {
      return static_cast<int>(i);
    }
  }
  return -1;
}

// --- lookups

std::shared_ptr<TimelineClip> TimelineTrack::clipForTime(float t) const {
  for (const auto& clip : sequencedClips_) {
    if (clip->intersectsWithTime(t)) {
      return clip;
    }
  }
  return nullptr;
}

std::shared_ptr<TimelineClip> TimelineTrack::controlPointForTime(float t) const {
  for (const auto& clip : sequencedClips_) {
    if (clip->isControlPointAtTime(t)) {
      return clip;
    }
  }
  return nullptr;
}

std::shared_ptr<TimelineClip> TimelineTrack::controlPointWithin(float d, float t) const {
  std::shared_ptr<TimelineClip> nearest;
  float best = d + 0.1f;
  for (const auto& clip : sequencedClips_) {
    if (clip->isControlPointWithin(d, t)) {
      const float distance = std::fabs(clip->begin() - t);
      if (distance < best) {
        best = distance;
        nearest = clip;
      }
    }
  }
  return nearest;
}

std::shared_ptr<TimelineClip> TimelineTrack::controlPointToLeftOfClip(
    const TimelineClip& clip) const {
  const int i = indexOfClip(&clip);
  return i > 0 ? sequencedClips_[static_cast<std::size_t>(i - 1)] : nullptr;
}

std::shared_ptr<TimelineClip> TimelineTrack::controlPointToRightOfClip(
    const TimelineClip& clip) const {
  const int i = indexOfClip(&clip);
  if (i < 0 || static_cast<std::size_t>(i) + 1 >= sequencedClips_.size()) {
    return nullptr;
  }
  return sequencedClips_[static_cast<std::size_t>(i) + 1];
}

std::shared_ptr<TimelineClip> TimelineTrack::editToLeftOfTime(float t) const {
  std::shared_ptr<TimelineClip> found;
  for (const auto& clip : sequencedClips_) {
    if (clip->isControlPoint() && clip->begin() < t) {
      found = clip;
    }
  }
  return found;
}

std::shared_ptr<TimelineClip> TimelineTrack::editToRightOfTime(float t) const {
  // Walked from the end, keeping the last match: the first in list order.
  std::shared_ptr<TimelineClip> found;
  for (auto it = sequencedClips_.rbegin(); it != sequencedClips_.rend(); ++it) {
    if ((*it)->isControlPoint() && (*it)->begin() > t) {
      found = *it;
    }
  }
  return found;
}

float TimelineTrack::totalLengthInSeconds() const {
  if (sequencedClips_.empty()) {
    return 0.0f;
  }
  const TimelineClip& last = *sequencedClips_.back();
  return last.isControlPoint() ? last.begin() : last.begin() + last.duration();
}

float TimelineTrack::objectDurationInSeconds() const {
  const ObjectPtr object = theObject();
  if (object && object->properties().find("durationInSeconds")) {
    if (auto seconds = numberAs<float>(object->valueForKey("durationInSeconds"))) {
      return *seconds;
    }
  }
  return 20.0f;
}

// --- editing

void TimelineTrack::addEditAtTime(float t) {
  if (const auto clip = clipForTime(t)) {
    clip->splitClipInSequence(*this, t);
  }
}

void TimelineTrack::justAddClip(std::shared_ptr<TimelineClip> clip) {
  if (clip) {
    sequencedClips_.push_back(std::move(clip));
  }
}

void TimelineTrack::addDefaultClipAtTime(float t, float d) {
  justAddClip(std::make_shared<TimelineClip>(t, d));
}

bool TimelineTrack::insertClipInSequenceAt(std::shared_ptr<TimelineClip> clip, float t) {
  if (!clip) {
    return false;
  }
  if (sequencedClips_.empty()) {
    // The clip keeps its own begin; the insertion time plays no part.
    sequencedClips_.push_back(TimelineClip::controlPointWithTime(0.0f));
    const float duration = clip->duration();
    sequencedClips_.push_back(std::move(clip));
    sequencedClips_.push_back(TimelineClip::controlPointWithTime(duration));
    return true;
  }
  const float d = clip->duration();
  logf("inserting at %0.2f dur %0.2f", t, d);
  const auto target = clipForTime(t);
  if (!target) {
    logf("insert at %0.2f refused: no clip covers that time", t);
    return false;
  }
  logf("insert into clip");
  const auto point = target->splitClipInSequence(*this, t);
  if (!point) {
    logf("insert at %0.2f refused: %s cannot be split", t, target->description());
    return false;
  }
  const int k = indexOfClip(point.get());
  for (std::size_t i = static_cast<std::size_t>(k) + 1; i < sequencedClips_.size(); ++i) {
    TimelineClip& later = *sequencedClips_[i];
    logf("moving clip %s at %0.2f", later.description(), later.begin());
    later.adjustBeginTime(d);
  }
  clip->setBegin(t);
  auto& clips = sequencedClips_;
  clips.insert(clips.begin() + k + 1, std::move(clip));
  // The copy loses the control-point flag (and a single value's value): a
  // zero-length ordinary element that no lookup finds, as ripple
  // insertion has always left it.
  auto after = point->copy();
  after->adjustBeginTime(d);
  clips.insert(clips.begin() + k + 2, std::move(after));
  logf("done inserting");
  return true;
}

bool TimelineTrack::controlPointsAt(float a, float b, int& ia, int& ib) {
  for (float t : {a, b}) {
    if (!controlPointForTime(t)) {
      addEditAtTime(t);
    }
  }
  // Both indices are taken once both points exist: the second split may
  // have moved the first point along the list.
  ia = indexOfClip(controlPointForTime(a).get());
  ib = indexOfClip(controlPointForTime(b).get());
  // A bound in no span has no control point: nothing to take out. Nor is
  // there when the point at b comes first in the list.
  return ia >= 0 && ib > 0;
}

void TimelineTrack::removeBetween(int ia, int ib) {
  // Of the elements strictly between the points, the last one stays.
  const int first = ia + 1;
  const int last = ib - 1;
  if (last - first > 0) {
    sequencedClips_.erase(sequencedClips_.begin() + first, sequencedClips_.begin() + last);
  }
}

void TimelineTrack::liftFrom(float a, float b) {
  int ia = 0;
  int ib = 0;
  if (controlPointsAt(a, b, ia, ib)) {
    removeBetween(ia, ib);
  }
}

void TimelineTrack::cutFrom(float a, float b) {
  int ia = 0;
  int ib = 0;
  if (!controlPointsAt(a, b, ia, ib)) {
    return;
  }
  for (std::size_t i = static_cast<std::size_t>(ib); i < sequencedClips_.size(); ++i) {
    TimelineClip& later = *sequencedClips_[i];
    logf("moving clip %s at %0.2f", later.description(), later.begin());
    later.adjustBeginTime(a - b);
  }
  removeBetween(ia, ib);
}

// --- applying

void TimelineTrack::applyEffectForTime(float t) {
  if (auto* layer = dynamic_cast<Layer*>(theObject().get())) {
    layer->setFrameForTime(t);
  }
}

void TimelineTrack::applyControlPointChange(TimelineClip&) {
  logf("default applyControlPointChange! %s", description());
}

void TimelineTrack::beginObservingObjectForEdit(EditPoint&) {}

void TimelineTrack::endObservingObjectForEdit(EditPoint&) {}

std::string TimelineTrack::currentValueDescription() const {
  const ObjectPtr object = theObject();
  return object ? describeValue(object->valueForKeyPath(managedKey_)) : std::string("(null)");
}

void TimelineTrack::dumpSequence() const {
  for (const auto& clip : sequencedClips_) {
    logf("Clip:%03.2f %03.2f %s", clip->begin(), clip->duration(), clip->description());
  }
}

void TimelineTrack::addItemsToMenu(Menu& menu, Timeline*, MyDocument* document) {
  const ObjectPtr self = weak_from_this().lock();
  menu.addSeparator();
  if (canRemove()) {
    menu.addItem("Remove", "menuRemoveTrack:", self);
  }
  insertAddableMenuItemsInMenu(menu, document);
  menu.addItem("Insert Filler", "menuInsertFiller:", self);
}

void TimelineTrack::insertAddableMenuItemsInMenu(Menu&, MyDocument*) {}

std::string TimelineTrack::description() const {
  return fmt::format("{}:{}", className(), title_.empty() ? managedKey_ : title_);
}

void TimelineTrack::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeList(sequencedClips_, "sequencedClips");
  coder.encodeInt32(fpsTimes100_, "fps_times_100");
  coder.encodeObject(theObject(), "theObject");
  coder.encodeString(managedKey_, "managedKey");
  coder.encodeFloat(narrowToFloat(timelineHeight()), "timelineHeight");
}

void TimelineTrack::initWithCoder(KeyedUnarchiver& coder) {
  sequencedClips_.clear();
  if (auto clips = coder.decodeListOfClassForKey<TimelineClip>("sequencedClips")) {
    // A null entry would have every lookup dereference it; it is dropped.
    for (auto& clip : *clips) {
      if (clip) {
        sequencedClips_.push_back(std::move(clip));
      }
    }
  }
  fpsTimes100_ = coder.decodeInt32ForKey("fps_times_100");
  theObject_ = coder.decodeObjectForKey("theObject");
  managedKey_ = coder.decodeStringForKey("managedKey");
  timelineHeight_ = coder.decodeDoubleForKey("timelineHeight");
}

}  // namespace cloudreel
