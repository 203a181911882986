#pragma once
// The base of everything placed and animated in the scene (layers and
// cameras): five transforms, the owning document, and the state of the
// interactive move/rotate tools.
//
// A point of the object's content is drawn through, outermost first:
// editingTransform · objectToWorld · animationTransform · editingOrigin ·
// inertialToObject. So an interactive move acts in world space before the
// committed placement, animation acts inside the placement, and an
// interactive rotation or scale acts about the object's own origin.
//
// Edits of the scale and translation of objectToWorld and inertialToObject
// are undoable: the object observes them with the undo action name ("Scale",
// "Translate") as context and registers the old value on the document's undo
// manager. A detached object (no document) registers nothing.

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "geometry/affine_transform.h"
#include "platform/object.h"

namespace cloudreel {

class MyDocument;
class TimelineTrack;

class Animatable3DObject : public Object, public Observer {
 public:
  // Five identity transforms; inertialToObject and objectToWorld observed.
  Animatable3DObject();
  ~Animatable3DObject() override;

  std::string_view className() const override { return "Animatable3DObject"; }
  const PropertyTable& properties() const override;

  // A new object of the receiver's own class holding copies of
  // inertialToObject, objectToWorld and animationTransform. The editing
  // transforms, flags and document are not copied. The copies are set
  // through the plain setters, so (as with decoding) the copy does not
  // observe them: its edits of them register no undo.
  std::shared_ptr<Animatable3DObject> copy() const;

  MyDocument* document() const { return document_; }
  const std::shared_ptr<AffineTransform>& inertialToObject() const { return inertialToObject_; }
  const std::shared_ptr<AffineTransform>& objectToWorld() const { return objectToWorld_; }
  const std::shared_ptr<AffineTransform>& animationTransform() const { return animationTransform_; }
  const std::shared_ptr<AffineTransform>& editingTransform() const { return editingTransform_; }
  const std::shared_ptr<AffineTransform>& editingOrigin() const { return editingOrigin_; }
  bool isEditing() const { return isEditing_; }
  bool isLocked() const { return isLocked_; }

  // Plain stores (observers of the key are told); they do not move the undo
  // observation to the new transform. A null transform is replaced by a
  // fresh identity, so the object always has all five.
  void setInertialToObject(std::shared_ptr<AffineTransform> t);
  void setObjectToWorld(std::shared_ptr<AffineTransform> t);
  void setAnimationTransform(std::shared_ptr<AffineTransform> t);
  void setEditingTransform(std::shared_ptr<AffineTransform> t);
  void setEditingOrigin(std::shared_ptr<AffineTransform> t);
  void setIsEditing(bool v) { changeValueForKey("isEditing", isEditing_, v); }
  void setIsLocked(bool v) { changeValueForKey("isLocked", isLocked_, v); }

  // Starts or stops observing "scale" and the three translations of a
  // transform for undo.
  void addObserversForAffine(AffineTransform& transform);
  void removeObserversForAffine(AffineTransform& transform);

  // Attaching to a document stores the back-pointer; subclasses also make
  // the document observe their undoable properties. Detaching undoes both.
  virtual void addObserversForDocument(MyDocument* document);
  virtual void removeObserversForDocument(MyDocument* document);

  // Appends the tracks the timeline can offer for the object's animatable
  // properties, each bound to this object; an object with none adds none.
  virtual void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks);

  // The undo target of every generic property change: sets the value by key
  // path on the object, then tells the document it has changed.
  void changeKeyPathOfObjectToValue(std::string_view keyPath, Object& object, const Value& value);

  // Undoably replaces both placing transforms; the new ones are observed.
  void setObjectToWorldInertialToObject(std::shared_ptr<AffineTransform> objectToWorld,
                                        std::shared_ptr<AffineTransform> inertialToObject);
  // Commits an interactive edit: the pending move and rotation/scale are
  // multiplied into the placement in one undoable step named `actionName`,
  // and the editing transforms return to identity.
  void applyEditingTransformNamed(std::string_view actionName);

  // Matrix-stack steps of the draw traversal: editingOrigin then
  // inertialToObject; editingTransform, objectToWorld, animationTransform;
  // and the pop matching the push of the caller's draw method.
  void transformInertialToObject() const;
  void transformObjectToWorld() const;
  void popTransformation() const;

  // The undo registration of a change of an observed transform.
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object& object,
                                                   const Change& change,
                                                   std::string_view context) override;

  // Writes "inertialToObject" and "objectToWorld". Reading takes the two
  // decoded transforms without observing them (edits of a decoded object's
  // transforms register no undo until setObjectToWorldInertialToObject
  // replaces them) and makes fresh identity animation and editing
  // transforms.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  // A blank object of the receiver's class, and the copying of this class's
  // state into it; every class that adds state extends both.
  virtual std::shared_ptr<Animatable3DObject> makeBlank() const;
  virtual void copyInto(Animatable3DObject& target) const;

  // Registers an undo step on the document's undo manager with this object
  // as target; does nothing while detached or when this object is not
  // shared-owned. The action runs only while the object is alive.
  void registerUndoAction(std::function<void(Animatable3DObject&)> action);

 private:
  void registerPlacementUndo();

  MyDocument* document_ = nullptr;
  std::shared_ptr<AffineTransform> inertialToObject_;
  std::shared_ptr<AffineTransform> objectToWorld_;
  std::shared_ptr<AffineTransform> animationTransform_;
  std::shared_ptr<AffineTransform> editingTransform_;
  std::shared_ptr<AffineTransform> editingOrigin_;
  bool isEditing_ = false;
  bool isLocked_ = false;
};

// A typed copy: copyOf(layer) is a std::shared_ptr<Layer>.
template <class T>
std::shared_ptr<T> copyOf(const T& object) {
  return std::static_pointer_cast<T>(object.copy());
}

}  // namespace cloudreel
