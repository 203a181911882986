#include "timeline/affine_clip.h"

#include <fmt/printf.h>

#include "camera/camera.h"
#include "camera/camera_path.h"
#include "geometry/affine_transform.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

std::shared_ptr<AffineClip> AffineClip::controlPointWithTime(float t) {
  auto clip = std::make_shared<AffineClip>(nullptr, t, 0.0f);
  clip->markAsControlPoint();
  return clip;
}

const PropertyTable& AffineClip::properties() const {
  using C = AffineClip;
  static const PropertyTable table(&TimelineClip::properties(),
                                   {property<C>("path", &C::path, &C::setPath)});
  return table;
}

std::shared_ptr<TimelineClip> AffineClip::makeBlank() const {
  return std::make_shared<AffineClip>();
}

void AffineClip::copyInto(TimelineClip& target) const {
  TimelineClip::copyInto(target);
  static_cast<AffineClip&>(target).path_ = path_;
}

ObjectPtr AffineClip::objectValueForSequenceTime(float t) const {
  if (!path_) {
    return nullptr;
  }
  const auto camera = path_->cameraInWorldSpaceForTime(pathTimeForSequenceTime(t));
  return camera ? camera->transformation() : nullptr;
}

void AffineClip::highlightFrameForTime(float t) {
  if (path_) {
    path_->setCurrentFrameForTime(pathTimeForSequenceTime(t));
  }
}

std::shared_ptr<TimelineClip> AffineClip::splitClipInSequence(TimelineTrack& track, float t) {
  const int k = indexInTrack(track);
  if (k < 0) {
    return nullptr;
  }
  logf("split AffineClip in seq %s at time %f", track.description(), t);
  const float rest = duration() - (t - begin());
  return finishSplit(track, k, t, std::make_shared<AffineClip>(nullptr, t, rest),
                     controlPointWithTime(t));
}

// Hue 0.5, saturation 0.4, brightness 1: a pale cyan.
Color AffineClip::defaultColor() const { return Color(0.6f, 1.0f, 1.0f, 1.0f); }

std::string AffineClip::description() const {
  return fmt::sprintf("AffineClip path:%s", path_ ? path_->description() : "(null)");
}

void AffineClip::encodeWithCoder(KeyedArchiver& coder) const {
  TimelineClip::encodeWithCoder(coder);
  coder.encodeObject(path_, "path");
}

void AffineClip::initWithCoder(KeyedUnarchiver& coder) {
  TimelineClip::initWithCoder(coder);
  path_ = coder.decodeObjectOfClassForKey<CameraPath>("path");
}

}  // namespace cloudreel
