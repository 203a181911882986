#include "scene/animatable_3d_object.h"

#include <epoxy/gl.h>

#include <array>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/undo_manager.h"
#include "render/affine_transform_gl.h"
#include "scene/my_document.h"

namespace cloudreel {

namespace {

// The observed keys of a placing transform and the undo action names their
// changes get.
struct ObservedKey {
  std::string_view key;
  std::string_view actionName;
};
constexpr std::array<ObservedKey, 4> kObservedAffineKeys{{
    {"scale", "Scale"},
    {"translationX", "Translate"},
    {"translationY", "Translate"},
    {"translationZ", "Translate"},
}};

std::shared_ptr<AffineTransform> orIdentity(std::shared_ptr<AffineTransform> t) {
  return t ? std::move(t) : std::make_shared<AffineTransform>();
}

}  // namespace

Animatable3DObject::Animatable3DObject()
    : inertialToObject_(std::make_shared<AffineTransform>()),
      objectToWorld_(std::make_shared<AffineTransform>()),
      animationTransform_(std::make_shared<AffineTransform>()),
      editingTransform_(std::make_shared<AffineTransform>()),
      editingOrigin_(std::make_shared<AffineTransform>()) {
  addObserversForAffine(*inertialToObject_);
  addObserversForAffine(*objectToWorld_);
}

Animatable3DObject::~Animatable3DObject() {
  // Decoded transforms were never observed; removing a registration that
  // does not exist is harmless.
  removeObserversForAffine(*inertialToObject_);
  removeObserversForAffine(*objectToWorld_);
}

const PropertyTable& Animatable3DObject::properties() const {
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<Animatable3DObject>("inertialToObject", &Animatable3DObject::inertialToObject,
                                    &Animatable3DObject::setInertialToObject),
       property<Animatable3DObject>("objectToWorld", &Animatable3DObject::objectToWorld,
                                    &Animatable3DObject::setObjectToWorld),
       property<Animatable3DObject>("animationTransform", &Animatable3DObject::animationTransform,
                                    &Animatable3DObject::setAnimationTransform),
       property<Animatable3DObject>("editingTransform", &Animatable3DObject::editingTransform,
                                    &Animatable3DObject::setEditingTransform),
       property<Animatable3DObject>("editingOrigin", &Animatable3DObject::editingOrigin,
                                    &Animatable3DObject::setEditingOrigin),
       property<Animatable3DObject>("isEditing", &Animatable3DObject::isEditing,
                                    &Animatable3DObject::setIsEditing),
       property<Animatable3DObject>("isLocked", &Animatable3DObject::isLocked,
                                    &Animatable3DObject::setIsLocked)});
  return table;
}

std::shared_ptr<Animatable3DObject> Animatable3DObject::copy() const {
  std::shared_ptr<Animatable3DObject> result = makeBlank();
  copyInto(*result);
  return result;
}

std::shared_ptr<Animatable3DObject> Animatable3DObject::makeBlank() const {
  return std::make_shared<Animatable3DObject>();
}

void Animatable3DObject::copyInto(Animatable3DObject& target) const {
  target.setInertialToObject(inertialToObject_->copy());
  target.setObjectToWorld(objectToWorld_->copy());
  target.setAnimationTransform(animationTransform_->copy());
}

void Animatable3DObject::setInertialToObject(std::shared_ptr<AffineTransform> t) {
  changeValueForKey("inertialToObject", inertialToObject_, orIdentity(std::move(t)));
}

void Animatable3DObject::setObjectToWorld(std::shared_ptr<AffineTransform> t) {
  changeValueForKey("objectToWorld", objectToWorld_, orIdentity(std::move(t)));
}

void Animatable3DObject::setAnimationTransform(std::shared_ptr<AffineTransform> t) {
  changeValueForKey("animationTransform", animationTransform_, orIdentity(std::move(t)));
}

void Animatable3DObject::setEditingTransform(std::shared_ptr<AffineTransform> t) {
  changeValueForKey("editingTransform", editingTransform_, orIdentity(std::move(t)));
}

void Animatable3DObject::setEditingOrigin(std::shared_ptr<AffineTransform> t) {
  changeValueForKey("editingOrigin", editingOrigin_, orIdentity(std::move(t)));
}

void Animatable3DObject::addObserversForAffine(AffineTransform& transform) {
  for (const ObservedKey& k : kObservedAffineKeys) {
    transform.addObserver(*this, std::string(k.key), ObservingOptions::Old,
                          std::string(k.actionName));
  }
}

void Animatable3DObject::removeObserversForAffine(AffineTransform& transform) {
  for (const ObservedKey& k : kObservedAffineKeys) {
    transform.removeObserver(*this, k.key);
  }
}

void Animatable3DObject::addObserversForDocument(MyDocument* document) { document_ = document; }

void Animatable3DObject::removeObserversForDocument(MyDocument*) { document_ = nullptr; }

void Animatable3DObject::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>&) {}

void Animatable3DObject::changeKeyPathOfObjectToValue(std::string_view keyPath, Object& object,
                                                      const Value& value) {
  object.setValueForKeyPath(value, keyPath);
  if (document_ != nullptr) {
    document_->hasChanged();
  }
}

void Animatable3DObject::registerUndoAction(std::function<void(Animatable3DObject&)> action) {
  if (document_ == nullptr) {
    return;
  }
  // The step holds the object weakly: an object gone by the time of the
  // undo is simply not there to change.
  std::weak_ptr<Object> weakSelf = weak_from_this();
  if (weakSelf.expired()) {
    logf("%s is not shared-owned; its change cannot be undone", std::string(className()));
    return;
  }
  document_->undoManager().registerUndoWithTarget(this, [weakSelf, action = std::move(action)] {
    if (const auto self = std::static_pointer_cast<Animatable3DObject>(weakSelf.lock())) {
      action(*self);
    }
  });
}

void Animatable3DObject::observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath,
                                                                     Object& object,
                                                                     const Change& change,
                                                                     std::string_view context) {
  if (document_ == nullptr) {
    return;
  }
  // The transform is held by the step, as the old value is: undoing sets
  // the value back on this very transform even if the object has replaced
  // it meanwhile.
  const ObjectPtr target = object.weak_from_this().lock();
  if (!target) {
    return;
  }
  const Value oldValue = change.oldValue.value_or(Value{});
  registerUndoAction([path = std::string(keyPath), target, oldValue](Animatable3DObject& self) {
    self.changeKeyPathOfObjectToValue(path, *target, oldValue);
  });
  document_->undoManager().setActionName(std::string(context));
  document_->hasChanged();
}

void Animatable3DObject::registerPlacementUndo() {
  registerUndoAction(
      [o = objectToWorld_->copy(), i = inertialToObject_->copy()](Animatable3DObject& self) {
        self.setObjectToWorldInertialToObject(o, i);
      });
}

void Animatable3DObject::setObjectToWorldInertialToObject(
    std::shared_ptr<AffineTransform> objectToWorld,
    std::shared_ptr<AffineTransform> inertialToObject) {
  registerPlacementUndo();
  willChangeValueForKey("objectToWorld");
  willChangeValueForKey("inertialToObject");
  removeObserversForAffine(*inertialToObject_);
  removeObserversForAffine(*objectToWorld_);
  objectToWorld_ = orIdentity(std::move(objectToWorld));
  inertialToObject_ = orIdentity(std::move(inertialToObject));
  addObserversForAffine(*inertialToObject_);
  addObserversForAffine(*objectToWorld_);
  if (document_ != nullptr) {
    document_->hasChanged();
  }
  didChangeValueForKey("objectToWorld");
  didChangeValueForKey("inertialToObject");
}

void Animatable3DObject::applyEditingTransformNamed(std::string_view actionName) {
  registerPlacementUndo();
  if (document_ != nullptr && !document_->undoManager().isUndoing()) {
    document_->undoManager().setActionName(std::string(actionName));
  }
  objectToWorld_->multiplyByMatrix(*editingTransform_);
  inertialToObject_->multiplyByMatrix(*editingOrigin_);
  editingTransform_->setIdentidy();
  editingOrigin_->setIdentidy();
}

void Animatable3DObject::transformInertialToObject() const {
  glMultMatrix(*editingOrigin_);
  glMultMatrix(*inertialToObject_);
}

void Animatable3DObject::transformObjectToWorld() const {
  glMultMatrix(*editingTransform_);
  glMultMatrix(*objectToWorld_);
  glMultMatrix(*animationTransform_);
}

void Animatable3DObject::popTransformation() const { glPopMatrix(); }

void Animatable3DObject::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeObject(inertialToObject_, "inertialToObject");
  coder.encodeObject(objectToWorld_, "objectToWorld");
}

void Animatable3DObject::initWithCoder(KeyedUnarchiver& coder) {
  removeObserversForAffine(*inertialToObject_);
  removeObserversForAffine(*objectToWorld_);
  // A missing transform reads as null; an identity stands in for it, so
  // every object has its five transforms.
  inertialToObject_ =
      orIdentity(coder.decodeObjectOfClassForKey<AffineTransform>("inertialToObject"));
  objectToWorld_ = orIdentity(coder.decodeObjectOfClassForKey<AffineTransform>("objectToWorld"));
  animationTransform_ = std::make_shared<AffineTransform>();
  editingOrigin_ = std::make_shared<AffineTransform>();
  editingTransform_ = std::make_shared<AffineTransform>();
}

}  // namespace cloudreel
