#pragma once
// A camera path built from other camera paths: an ordered list of members,
// each taking its own path's camera at a frame and multiplying its rotation
// and (gained, optionally negated) translation into one combined transform.
// Several recorded motions layered onto one object this way are offered to
// the timeline beside the plain paths.

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "camera/camera_path.h"
#include "platform/object.h"

namespace cloudreel {

class AffineTransform;

class TransformStackMember : public Object {
 public:
  // No path; for the archive's factory.
  TransformStackMember() = default;
  // The path, named after it, gain 1, both parts enabled, nothing inverted.
  static std::shared_ptr<TransformStackMember> initWithCameraPath(std::shared_ptr<CameraPath> path);

  std::string_view className() const override { return "TransformStackMember"; }
  const PropertyTable& properties() const override;

  const std::shared_ptr<CameraPath>& path() const { return path_; }
  // The path's name when the member was made; not archived, not refreshed.
  const std::string& name() const { return name_; }
  float translationGain() const { return translationGain_; }
  // Stored and archived, but it changes nothing: the rotation is always
  // taken as the path gives it, as saved stacks were made.
  bool invertRotation() const { return invertRotation_; }
  bool invertTranslation() const { return invertTranslation_; }
  bool enableRotation() const { return enableRotation_; }
  bool enableTranslation() const { return enableTranslation_; }

  // Plain stores (a set by key is announced).
  void setPath(std::shared_ptr<CameraPath> v) { path_ = std::move(v); }
  void setName(std::string v) { name_ = std::move(v); }
  void setTranslationGain(float v) { translationGain_ = v; }
  void setInvertRotation(bool v) { invertRotation_ = v; }
  void setInvertTranslation(bool v) { invertTranslation_ = v; }
  void setEnableRotation(bool v) { enableRotation_ = v; }
  void setEnableTranslation(bool v) { enableTranslation_ = v; }

  // target becomes M · target, M holding the rotation (inertialToObject) of
  // the path's world-space camera at `frame` when enabled and that camera's
  // position, negated when inverted and times the gain, as translation when
  // enabled. A member without a path, or whose path has no camera at the
  // frame (a shorter discrete path asked past its end), leaves the target
  // as it is.
  void applyTransformationToForFrame(AffineTransform& target, std::int32_t frame) const;

  // "path", "translationGain", "invertRotation", "invertTranslation",
  // "enableRotation", "enableTranslation". Read back, missing switches are
  // NO, a missing gain 0, and the name stays empty.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  std::shared_ptr<CameraPath> path_;
  std::string name_;
  float translationGain_ = 1.0f;
  bool invertRotation_ = false;
  bool invertTranslation_ = false;
  bool enableRotation_ = true;
  bool enableTranslation_ = true;
};

class TransformStack : public CameraPath {
 public:
  // Empty, named "New stack".
  TransformStack();

  std::string_view className() const override { return "TransformStack"; }

  const std::vector<std::shared_ptr<TransformStackMember>>& transformations() const {
    return transformations_;
  }
  void setTransformations(std::vector<std::shared_ptr<TransformStackMember>> v);
  // Appends, announced as a change of "transformations".
  void addTransformation(std::shared_ptr<TransformStackMember> member);
  // Exchange a member with its neighbour above (i - 1) or below (i + 1),
  // announced as a change of "transformations"; an index with no such
  // neighbour changes and announces nothing.
  void moveItemUp(std::int32_t i);
  void moveItemDown(std::int32_t i);

  // The most frames among the members' paths; 0 when empty.
  std::int32_t nFrames() const override;
  // A fresh camera whose inertialToObject has every member applied in list
  // order, so the last member's transform is outermost: Mn · … · M1.
  std::shared_ptr<Camera> cameraInObjectSpaceForFrame(std::int32_t frame) const override;
  // Frame nFrames × t truncated: t = 1 asks for one past the last frame.
  std::shared_ptr<Camera> cameraInObjectSpaceForTime(float t) const override;

  // After the path keys: "transformations", the list.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The same members, not copies.
  void copyInto(Animatable3DObject& target) const override;

 private:
  std::vector<std::shared_ptr<TransformStackMember>> transformations_;
  // Set while the stack asks its members: a stack reached again through its
  // own members (a cycle a damaged document can hold) counts as empty there
  // instead of recursing without end.
  mutable bool busy_ = false;
};

}  // namespace cloudreel
