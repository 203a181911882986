#include "camera/source_camera.h"

#include <epoxy/gl.h>
#include <stb/stb_image.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/value.h"
#include "render/gl/gl_context.h"
#include "render/gl/image.h"
#include "render/gl/pixel_store.h"

namespace cloudreel {

namespace {

// Decoded pixels, top row first, freed with stb_image's own deallocator.
struct DecodedPhotograph {
  struct Free {
    void operator()(stbi_uc* p) const { stbi_image_free(p); }
  };
  std::unique_ptr<stbi_uc, Free> pixels;
  int width = 0;
  int height = 0;
  int channels = 0;  // 3 or 4
};

// Decodes as RGB, or RGBA when the file has alpha (grey becomes RGB).
DecodedPhotograph decode(const std::filesystem::path& file) {
  DecodedPhotograph photo;
  int w = 0, h = 0, components = 0;
  if (stbi_info(file.c_str(), &w, &h, &components) == 0) {
    return photo;
  }
  const int wanted = components == 2 || components == 4 ? 4 : 3;
  photo.pixels.reset(stbi_load(file.c_str(), &w, &h, &components, wanted));
  if (photo.pixels) {
    photo.width = w;
    photo.height = h;
    photo.channels = wanted;
  }
  return photo;
}

// Every `step`-th pixel of every `step`-th row: a photograph reduced to fit
// the largest texture, without the cost of filtering a picture that is shown
// far smaller than that anyway.
std::vector<std::uint8_t> subsampled(const DecodedPhotograph& photo, int step, int& width,
                                     int& height) {
  width = (photo.width + step - 1) / step;
  height = (photo.height + step - 1) / step;
  const auto channels = static_cast<std::size_t>(photo.channels);
  std::vector<std::uint8_t> out(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
                                channels);
  std::uint8_t* to = out.data();
  for (int y = 0; y < photo.height; y += step) {
    const std::uint8_t* row = photo.pixels.get() + static_cast<std::size_t>(y) *
                                                       static_cast<std::size_t>(photo.width) *
                                                       channels;
    for (int x = 0; x < photo.width; x += step) {
      for (std::size_t c = 0; c < channels; ++c) {
        *to++ = row[static_cast<std::size_t>(x) * channels + c];
      }
    }
  }
  return out;
}

}  // namespace

const PropertyTable& SourceCamera::properties() const {
  static const PropertyTable table(
      &Camera::properties(),
      {readOnlyProperty<SourceCamera>("imagePath", &SourceCamera::imagePath),
       property<SourceCamera>("hasImage", &SourceCamera::hasImage, &SourceCamera::setHasImage)});
  return table;
}

void SourceCamera::setImagePath(const std::filesystem::path& path) {
  texture_.reset();
  // Kept even when it cannot be read, to say which file is missing.
  photographFile_ = path;
  decodeFailed_ = false;
  imageWidth_ = 0;
  imageHeight_ = 0;
  int w = 0, h = 0, components = 0;
  if (path.empty() || stbi_info(path.c_str(), &w, &h, &components) == 0 || w <= 0 || h <= 0) {
    setHasImage(false);
    return;
  }
  imageWidth_ = w;
  imageHeight_ = h;
  setAspect(static_cast<float>(w) / static_cast<float>(h));
  setHasImage(true);
}

float SourceCamera::fieldOfViewInRadians() const {
  const double width = hasImage_ ? static_cast<double>(imageWidth_) : 0.0;
  // A focal of 0 divides to an infinity, whose arctangent is ±π/2: defined.
  return static_cast<float>(2.0 * std::atan((width - 1.0) / (2.0 * focal_)));
}

float SourceCamera::fieldOfView() const {
  return static_cast<float>(static_cast<double>(fieldOfViewInRadians() * 180.0f) /
                            3.141592653589793);
}

void SourceCamera::uploadOpenGLTexture() {
  gl::GLContext* context = gl::GLContext::current();
  if (!hasImage_ || decodeFailed_ || context == nullptr) {
    return;
  }
  DecodedPhotograph photo = decode(photographFile_);
  if (!photo.pixels) {
    // Logged once: from now on the camera has no photograph to decode.
    const char* reason = stbi_failure_reason();
    logWarningf("cannot decode photograph %s: %s", photographFile_.string(),
                reason != nullptr ? reason : "unknown reason");
    decodeFailed_ = true;
    imageWidth_ = 0;
    imageHeight_ = 0;
    setAspect(1.0f);
    setHasImage(false);
    return;
  }
  GLint maxSize = 0;
  glGetIntegerv(GL_MAX_TEXTURE_SIZE, &maxSize);
  maxSize = maxSize > 0 ? maxSize : 1024;
  const int largest = std::max(photo.width, photo.height);
  const int step = (largest + maxSize - 1) / maxSize;
  int width = photo.width, height = photo.height;
  std::vector<std::uint8_t> reduced;
  std::uint8_t* pixels = photo.pixels.get();
  if (step > 1) {
    reduced = subsampled(photo, step, width, height);
    photo.pixels.reset();
    pixels = reduced.data();
  }
  const std::size_t rowBytes =
      static_cast<std::size_t>(width) * static_cast<std::size_t>(photo.channels);
  // Texture rows go bottom first, so the picture's top row becomes the last.
  gl::flipRows({pixels, rowBytes * static_cast<std::size_t>(height)}, rowBytes,
               static_cast<std::size_t>(height));

  GLuint name = 0;
  glGenTextures(1, &name);
  texture_ = gl::GLName(*context, gl::NameKind::Texture, name);
  glBindTexture(GL_TEXTURE_2D, name);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_REPEAT);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_REPEAT);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
  glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
  const gl::TightPixelStore tight;
  const GLenum format = photo.channels == 4 ? GL_RGBA : GL_RGB;
  glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, width, height, 0, format, GL_UNSIGNED_BYTE, pixels);
}

void SourceCamera::drawImageWithFrustumLength(float length, float opacity) {
  if (!selected() || decodeFailed_) {
    return;
  }
  const float h = length * std::tan(fieldOfViewInRadians() / 2.0f);
  const float v = h / aspect();
  if (texture_.usableInCurrentContext()) {
    glBindTexture(GL_TEXTURE_2D, texture_.get());
  } else {
    // First use, or a context outside the texture's share group. Without a
    // photograph nothing is bound, so no texture of the caller's shows.
    texture_.reset();
    glBindTexture(GL_TEXTURE_2D, 0);
    uploadOpenGLTexture();
    if (decodeFailed_) {
      return;
    }
  }
  glColor4f(1.0f, 1.0f, 1.0f, opacity);
  glEnable(GL_TEXTURE_2D);
  glDepthMask(GL_FALSE);
  glBegin(GL_QUADS);
  glTexCoord2f(1.0f, 1.0f);
  glVertex3f(h, v, -length);
  glTexCoord2f(0.0f, 1.0f);
  glVertex3f(-h, v, -length);
  glTexCoord2f(0.0f, 0.0f);
  glVertex3f(-h, -v, -length);
  glTexCoord2f(1.0f, 0.0f);
  glVertex3f(h, -v, -length);
  glEnd();
  glDisable(GL_TEXTURE_2D);
  glDepthMask(GL_TRUE);
  glBindTexture(GL_TEXTURE_2D, 0);
}

void SourceCamera::encodeWithCoder(KeyedArchiver& coder) const {
  Camera::encodeWithCoder(coder);
  coder.encodeString(imagePath_, "imagePath");
  // Narrowed to the nearest float; beyond a float's range, to ±infinity.
  coder.encodeFloat(narrowToFloat(focal_), "focal");
  coder.encodeFloat(narrowToFloat(k1_), "k1");
  coder.encodeFloat(narrowToFloat(k2_), "k2");
}

void SourceCamera::initWithCoder(KeyedUnarchiver& coder) {
  Camera::initWithCoder(coder);
  setImagePath(coder.decodeStringForKey("imagePath"));
  focal_ = coder.decodeFloatForKey("focal");
  k1_ = coder.decodeFloatForKey("k1");
  k2_ = coder.decodeFloatForKey("k2");
}

std::shared_ptr<Animatable3DObject> SourceCamera::makeBlank() const {
  return std::make_shared<SourceCamera>();
}

void SourceCamera::copyInto(Animatable3DObject& target) const {
  Camera::copyInto(target);
  auto& camera = static_cast<SourceCamera&>(target);
  camera.focal_ = focal_;
  camera.k1_ = k1_;
  camera.k2_ = k2_;
  // The photograph's size, so the copy sees through the same lens; its
  // pixels are decoded again only if the copy draws them.
  camera.hasImage_ = hasImage_;
  camera.imageWidth_ = imageWidth_;
  camera.imageHeight_ = imageHeight_;
  camera.photographFile_ = photographFile_;
  camera.decodeFailed_ = decodeFailed_;
  if (hasImage_) {
    camera.setAspect(aspect());
  }
}

}  // namespace cloudreel
