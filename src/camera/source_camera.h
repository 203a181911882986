#pragma once
// A camera that took one of the photographs of a reconstruction: its focal
// length and lens distortion as the reconstruction found them, and the
// photograph itself, which the camera derives its field of view and aspect
// from and which it shows, when selected, as a picture at the end of its
// frustum.
//
// Only the photograph's header is read when its path is set, so a
// reconstruction of a thousand photographs opens without decoding any of
// them. The pixels are decoded when the texture is first needed and freed
// as soon as they are uploaded. A photograph whose header reads but whose
// pixels do not is found out only then: from that draw on the camera is one
// without a photograph, and shows none.

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>

#include "camera/camera.h"
#include "render/gl/gl_name.h"

namespace cloudreel {

class SourceCamera : public Camera {
 public:
  SourceCamera() = default;

  std::string_view className() const override { return "SourceCamera"; }
  const PropertyTable& properties() const override;

  // The focal length in pixels and the radial distortion coefficients. The
  // coefficients are kept and archived; nothing corrects for them.
  double focal() const { return focal_; }
  double k1() const { return k1_; }
  double k2() const { return k2_; }
  void setFocal(double v) { focal_ = v; }
  void setK1(double v) { k1_ = v; }
  void setK2(double v) { k2_ = v; }

  // Replaces the photograph by the one at `path`: its size is read from the
  // file's header (JPEG, PNG and the other formats stb_image knows) and the
  // aspect becomes width / height. A file that cannot be read as an image
  // leaves the camera without a photograph (hasImage NO, size 0), which is
  // not an error. The path is deliberately not kept in imagePath, so an
  // archived camera comes back without its photograph. Setting a path
  // forgets that an earlier photograph did not decode.
  void setImagePath(const std::filesystem::path& path);
  // Always empty (see setImagePath); archived as it is.
  const std::string& imagePath() const { return imagePath_; }
  // The file last named for the photograph, kept even when it could not be
  // read, so that the photograph window can say which file is missing;
  // empty when none was named. Not archived, like the photograph.
  const std::filesystem::path& photographPath() const { return photographFile_; }
  bool hasImage() const { return hasImage_; }
  void setHasImage(bool v) { changeValueForKey("hasImage", hasImage_, v); }
  int imageWidth() const { return imageWidth_; }
  int imageHeight() const { return imageHeight_; }
  // The texture made from the photograph; 0 until the first draw.
  unsigned int glTextureName() const { return texture_.get(); }

  // 2·atan((w − 1) / (2·focal)), w the photograph's width in pixels (0
  // without a photograph, which gives a small negative angle). The stored
  // field of view of a plain camera is not used.
  float fieldOfViewInRadians() const override;
  // The same in degrees.
  float fieldOfView() const override;

  // Makes the texture from the photograph in the current context and leaves
  // it bound. The pixels are decoded now and freed once uploaded. Does
  // nothing without a photograph or without a current context. When the
  // pixels do not decode, the failure is logged and the camera is left
  // without a photograph (hasImage NO, size 0, aspect 1), which is not
  // tried again until a new path is set. A photograph larger than the
  // largest texture the context allows is uploaded at a whole fraction of
  // its size.
  void uploadOpenGLTexture();

  bool canDrawImage() const override { return true; }
  // For a selected camera only, in the camera's own space: the photograph
  // on a quad at z = −length filling the frustum's end, in white at
  // `opacity`, without writing depth. A camera whose photograph is missing
  // draws the quad untextured, in plain white; one whose photograph did not
  // decode, on this draw or an earlier one, draws nothing.
  void drawImageWithFrustumLength(float length, float opacity) override;

  // After the camera keys: "imagePath" (string), "focal", "k1", "k2"
  // (32-bit floats). The decoded path goes to setImagePath.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The camera copy, then focal, k1, k2 and the photograph's file and size
  // (with the aspect) or that it did not decode, so that the cameras a
  // camera path hands out for its frames see as their source does. The
  // texture is not shared.
  void copyInto(Animatable3DObject& target) const override;

 private:
  double focal_ = 0.0;
  double k1_ = 0.0;
  double k2_ = 0.0;
  std::string imagePath_;
  bool hasImage_ = false;
  int imageWidth_ = 0;
  int imageHeight_ = 0;
  // Where the photograph is decoded from when the texture is made (only
  // while hasImage says it could be read).
  std::filesystem::path photographFile_;
  bool decodeFailed_ = false;
  gl::GLName texture_;
};

}  // namespace cloudreel
