#pragma once
// A clip whose value is a transform taken from a camera path (or a
// transform stack, which is one): over the clip the path's own time runs
// from 0 to 1 through the ramp, and the clip answers the transformation of
// the path's world-space camera at that time. Transform tracks use it for
// their spans and their control points.

#include <memory>
#include <string>
#include <string_view>

#include "timeline/timeline_clip.h"

namespace cloudreel {

class CameraPath;

class AffineClip : public TimelineClip {
 public:
  AffineClip() = default;
  // The path is shared, not copied; it may be null (the clip then yields
  // no transform).
  AffineClip(std::shared_ptr<CameraPath> path, float begin, float duration)
      : TimelineClip(begin, duration), path_(std::move(path)) {}
  static std::shared_ptr<AffineClip> controlPointWithTime(float t);

  std::string_view className() const override { return "AffineClip"; }
  const PropertyTable& properties() const override;

  const std::shared_ptr<CameraPath>& path() const { return path_; }
  void setPath(std::shared_ptr<CameraPath> path) { changeValueForKey("path", path_, path); }

  // An AffineTransform, or null without a path or where the path has no
  // camera.
  ObjectPtr objectValueForSequenceTime(float t) const override;
  // Moves the path's current frame to the clip's time, for the editor's
  // highlight.
  void highlightFrameForTime(float t) override;
  // The second half has no path until it is given one.
  std::shared_ptr<TimelineClip> splitClipInSequence(TimelineTrack& track, float t) override;

  Color defaultColor() const override;
  std::string description() const override;

  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<TimelineClip> makeBlank() const override;
  void copyInto(TimelineClip& target) const override;

 private:
  float pathTimeForSequenceTime(float t) const { return rampValueForClipTime(t - begin(), 1.0f); }

  std::shared_ptr<CameraPath> path_;
};

}  // namespace cloudreel
