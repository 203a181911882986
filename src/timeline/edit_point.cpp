#include "timeline/edit_point.h"

#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

void EditPoint::beginEditingClip() {
  const auto clip = clip_.lock();
  const auto track = track_.lock();
  if (!clip || !track) {
    return;
  }
  clip->setIsEditing(true);
  track->beginObservingObjectForEdit(*this);
}

void EditPoint::endEditingClip() {
  const auto clip = clip_.lock();
  const auto track = track_.lock();
  if (!clip || !track) {
    return;
  }
  track->endObservingObjectForEdit(*this);
  track->applyControlPointChange(*clip);
  clip->setIsEditing(false);
}

void EditPoint::observeChange(const Change& change) {
  if (const auto clip = clip_.lock()) {
    clip->observeChangeForEdit(change, *this);
  }
}

}  // namespace cloudreel
