#include "timeline/affine_track.h"

#include "camera/camera_path.h"
#include "camera/transform_stack.h"
#include "geometry/affine_transform.h"
#include "geometry/vector3.h"
#include "platform/log.h"
#include "scene/animatable_3d_object.h"
#include "scene/my_document.h"
#include "timeline/affine_clip.h"
#include "timeline/edit_point.h"
#include "timeline/menu_description.h"

namespace cloudreel {

AffineTrack::AffineTrack(const ObjectPtr& object, std::string title)
    : TimelineTrack(object, std::string(), std::move(title)) {}

void AffineTrack::addDefaultClipAtTime(float t, float d) {
  justAddClip(AffineClip::controlPointWithTime(t));
  justAddClip(std::make_shared<AffineClip>(nullptr, t, d));
  justAddClip(AffineClip::controlPointWithTime(t + d));
}

void AffineTrack::applyEffectForTime(float t) {
  auto* object = dynamic_cast<Animatable3DObject*>(theObject().get());
  if (!object) {
    return;
  }
  const auto clip = clipForTime(t);
  if (!clip) {
    object->animationTransform()->setIdentidy();
    return;
  }
  // A clip without a transform (no path yet) leaves identity: the object's
  // setter replaces a null transform by a fresh identity.
  object->setAnimationTransform(objectAs<AffineTransform>(clip->objectValueForSequenceTime(t)));
  clip->highlightFrameForTime(t);
}

std::string AffineTrack::currentValueDescription() const {
  const auto* object = dynamic_cast<const Animatable3DObject*>(theObject().get());
  return object ? object->animationTransform()->translationAsVector3()->description()
                : std::string("(null)");
}

void AffineTrack::insertAddableMenuItemsInMenu(Menu& menu, MyDocument* document) {
  if (!document) {
    return;
  }
  const auto self = std::static_pointer_cast<TimelineTrack>(weak_from_this().lock());
  const auto paths = document->cameraPaths();
  logf("cameraPaths count: %ld", static_cast<long>(paths.size()));
  const auto offer = [&](const std::shared_ptr<CameraPath>& path) {
    auto clip = std::make_shared<AffineClip>(path, 0.0f, path->durationInSeconds());
    menu.addItem(path->name(),
                 "menuAddDiscreteClip:", std::make_shared<ClipInsertion>(std::move(clip), self));
  };
  for (const auto& path : paths) {
    offer(path);
  }
  const ObjectPtr own = theObject();
  for (const auto& stack : document->transformStacks()) {
    if (stack != own) {
      offer(stack);
    }
  }
}

}  // namespace cloudreel
