#pragma once
// A track that drives its object's animation transform: where a clip covers
// the time the transform becomes the clip's (a camera path's camera at that
// moment), elsewhere it goes back to identity. Its menu offers a clip on
// each of the document's camera paths and transform stacks.

#include <memory>
#include <string>
#include <string_view>

#include "timeline/timeline_track.h"

namespace cloudreel {

class AffineTrack : public TimelineTrack {
 public:
  AffineTrack() = default;
  AffineTrack(const ObjectPtr& object, std::string title);

  std::string_view className() const override { return "AffineTrack"; }

  // A control point at t, a span of d seconds on no path, a control point
  // at t + d.
  void addDefaultClipAtTime(float t, float d) override;
  void applyEffectForTime(float t) override;
  void applyControlPointChange(TimelineClip&) override {}
  // The translation of the object's animation transform.
  std::string currentValueDescription() const override;
  // One item per camera path of the document, then per transform stack
  // other than the track's own object, each offering a clip on that path
  // as long as the path.
  void insertAddableMenuItemsInMenu(Menu& menu, MyDocument* document) override;
};

}  // namespace cloudreel
