#include "scene/animated_card.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>
#include <deque>
#include <limits>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/run_loop.h"
#include "render/gl/gl_context.h"
#include "render/gl/gl_name.h"
#include "render/gl/pixel_store.h"
#include "render/render_options.h"
#include "scene/image_sequence.h"
#include "scene/image_sequence_decoder.h"
#include "scene/my_document.h"
#include "timeline/float_value_track.h"

namespace cloudreel {

namespace {

// The keys the document observes for undo, with the undo steps' names.
constexpr Layer::UndoableKey kUndoableKeys[] = {{"imagePath", "Change Picture"},
                                                {"cardHeight", "Change Size"},
                                                {"opacity", "Change Opacity"},
                                                {"frameOffset", "Change Frame Offset"},
                                                {"FPS", "Change Frame Rate"}};

float finiteOr(float v, float fallback) { return std::isfinite(v) ? v : fallback; }

// Every step-th pixel of every step-th row: a picture larger than the
// largest texture the context takes is shown at a whole fraction of its
// size rather than not at all.
std::vector<std::uint8_t> subsampled(const DecodedImage& image, int step, int& width, int& height) {
  width = image.width / step;
  height = image.height / step;
  std::vector<std::uint8_t> out(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) *
                                4);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const std::size_t from =
          (static_cast<std::size_t>(y * step) * static_cast<std::size_t>(image.width) +
           static_cast<std::size_t>(x * step)) *
          4;
      std::copy_n(image.pixels.data() + from, 4,
                  out.data() + (static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
                                static_cast<std::size_t>(x)) *
                                   4);
    }
  }
  return out;
}

}  // namespace

struct AnimatedCard::Texture {
  int picture = -1;
  int width = 0;
  int height = 0;
  gl::GLName name;
};

struct AnimatedCard::TextureCache {
  std::deque<Texture> textures;
};

AnimatedCard::AnimatedCard()
    : textures_(std::make_unique<TextureCache>()),
      redrawPending_(std::make_shared<std::atomic<bool>>(false)) {
  setName("Card");
}

AnimatedCard::~AnimatedCard() {
  // The workers stop before the textures go.
  decoder_.reset();
}

const PropertyTable& AnimatedCard::properties() const {
  static const PropertyTable table(
      &AnimatedLayer::properties(),
      {property<AnimatedCard>("imagePath", &AnimatedCard::imagePath, &AnimatedCard::setImagePath),
       property<AnimatedCard>("cardHeight", &AnimatedCard::cardHeight,
                              &AnimatedCard::setCardHeight),
       property<AnimatedCard>("opacity", &AnimatedCard::opacity, &AnimatedCard::setOpacity),
       property<AnimatedCard>("frameOffset", &AnimatedCard::frameOffset,
                              &AnimatedCard::setFrameOffset),
       property<AnimatedCard>("frame", &AnimatedCard::frame, &AnimatedCard::setFrame),
       readOnlyProperty<AnimatedCard>("aspect", &AnimatedCard::aspect),
       readOnlyProperty<AnimatedCard>("sourceError", &AnimatedCard::sourceError)});
  return table;
}

std::shared_ptr<Animatable3DObject> AnimatedCard::makeBlank() const {
  return std::make_shared<AnimatedCard>();
}

void AnimatedCard::copyInto(Animatable3DObject& target) const {
  AnimatedLayer::copyInto(target);
  auto& copy = static_cast<AnimatedCard&>(target);
  copy.setCardHeight(cardHeight_);
  copy.setOpacity(opacity_);
  copy.setFrameOffset(frameOffset_);
  copy.setFrame(frame_);
  copy.setImagePath(imagePath_);
}

// --- the pictures

void AnimatedCard::setImagePath(std::string path) {
  willChangeValueForKey("aspect");
  willChangeValueForKey("sourceError");
  changeValueForKey("imagePath", imagePath_, std::move(path));
  findSequence();
  didChangeValueForKey("sourceError");
  didChangeValueForKey("aspect");
}

void AnimatedCard::findSequence() {
  decoder_.reset();
  textures_->textures.clear();
  lastShown_ = -1;
  missingFiles_.clear();
  imageWidth_ = 0;
  imageHeight_ = 0;
  sourceError_.clear();
  if (imagePath_.empty()) {
    setNFrames(0);
    return;
  }
  Error error;
  std::optional<ImageSequence> sequence = ImageSequence::resolve(imagePath_, &error);
  if (!sequence) {
    sourceError_ = error.message;
    logWarningf("card \"%s\": %s", name(), sourceError_);
    setNFrames(0);
    return;
  }
  // The size comes from the first picture whose header reads: a sequence
  // whose first files are missing still gets its shape.
  const int probe = std::min(sequence->frameCount(), 32);
  for (int i = 0; i < probe; ++i) {
    int w = 0, h = 0;
    if (readImageSize(sequence->fileForFrame(i), &w, &h) && w > 0 && h > 0) {
      imageWidth_ = w;
      imageHeight_ = h;
      break;
    }
  }
  decoder_ = std::make_unique<ImageSequenceDecoder>(std::move(*sequence), kDecodeBudget);
  // A picture decoded while the view is idle should show without waiting
  // for the next unrelated redraw. The workers only flag and post; the
  // redraw itself happens on the main loop, if the card still exists.
  const std::weak_ptr<Object> weak = weak_from_this();
  const std::shared_ptr<std::atomic<bool>> pending = redrawPending_;
  decoder_->setFrameDoneHandler([weak, pending](int) {
    if (pending->exchange(true)) {
      return;
    }
    RunLoop::main().post([weak, pending] {
      pending->store(false);
      if (const auto self = weak.lock()) {
        if (MyDocument* document = static_cast<AnimatedCard&>(*self).document()) {
          document->redrawViews();
        }
      }
    });
  });
  setNFrames(decoder_->sequence().frameCount());
}

float AnimatedCard::aspect() const {
  return imageWidth_ > 0 && imageHeight_ > 0
             ? static_cast<float>(imageWidth_) / static_cast<float>(imageHeight_)
             : 1.0f;
}

void AnimatedCard::setCardHeight(float v) {
  changeValueForKey("cardHeight", cardHeight_, std::max(finiteOr(v, 0.0f), 0.0f));
}

void AnimatedCard::setOpacity(float v) {
  changeValueForKey("opacity", opacity_, std::clamp(finiteOr(v, 1.0f), 0.0f, 1.0f));
}

void AnimatedCard::setFrame(float v) { changeValueForKey("frame", frame_, finiteOr(v, 0.0f)); }

void AnimatedCard::setFrameForTime(float seconds) { setFrame(seconds * static_cast<float>(FPS())); }

int AnimatedCard::pictureIndex() const {
  if (!decoder_) {
    return 0;
  }
  // In 64 bits and clamped, so no frame or offset can overflow.
  const double whole = std::floor(static_cast<double>(frame_));
  const auto frame = static_cast<std::int64_t>(std::clamp(whole, -1e12, 1e12));
  const std::int64_t picture = frame + frameOffset_;
  return static_cast<int>(
      std::clamp<std::int64_t>(picture, 0, decoder_->sequence().frameCount() - 1));
}

std::filesystem::path AnimatedCard::pictureFile() const {
  return decoder_ ? decoder_->sequence().fileForFrame(pictureIndex()) : std::filesystem::path();
}

int AnimatedCard::picturesDecoded() const { return decoder_ ? decoder_->framesHeld() : 0; }

int AnimatedCard::texturesHeld() const { return static_cast<int>(textures_->textures.size()); }

// --- drawing

const AnimatedCard::Texture* AnimatedCard::cachedTexture(int picture) {
  const auto it = std::find_if(textures_->textures.begin(), textures_->textures.end(),
                               [picture](const Texture& t) { return t.picture == picture; });
  if (it == textures_->textures.end()) {
    return nullptr;
  }
  if (!it->name.usableInCurrentContext()) {
    // Made in a context outside the current share group: made again.
    textures_->textures.erase(it);
    return nullptr;
  }
  std::rotate(textures_->textures.begin(), it, it + 1);
  return &textures_->textures.front();
}

const AnimatedCard::Texture* AnimatedCard::textureForDrawing(bool wait) {
  gl::GLContext* context = gl::GLContext::current();
  if (!decoder_ || context == nullptr) {
    return nullptr;
  }
  const int picture = pictureIndex();
  if (const Texture* texture = cachedTexture(picture)) {
    lastShown_ = picture;
    return texture;
  }
  const ImageSequenceDecoder::Frame frame =
      wait ? decoder_->waitFor(picture) : decoder_->request(picture);
  if (frame.state == ImageSequenceDecoder::State::Ready && frame.image && frame.image->width > 0 &&
      frame.image->height > 0) {
    const DecodedImage& image = *frame.image;
    GLint maxSize = 0;
    glGetIntegerv(GL_MAX_TEXTURE_SIZE, &maxSize);
    maxSize = maxSize > 0 ? maxSize : 1024;
    const int step = (std::max(image.width, image.height) + maxSize - 1) / maxSize;
    int width = image.width, height = image.height;
    std::vector<std::uint8_t> reduced;
    const std::uint8_t* pixels = image.pixels.data();
    if (step > 1) {
      reduced = subsampled(image, step, width, height);
      pixels = reduced.data();
    }
    GLuint name = 0;
    glGenTextures(1, &name);
    Texture texture{picture, width, height, gl::GLName(*context, gl::NameKind::Texture, name)};
    glBindTexture(GL_TEXTURE_2D, name);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
    {
      const gl::TightPixelStore tight;
      glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, width, height, 0, GL_RGBA, GL_UNSIGNED_BYTE, pixels);
    }
    glBindTexture(GL_TEXTURE_2D, 0);
    textures_->textures.push_front(std::move(texture));
    while (static_cast<int>(textures_->textures.size()) > kTextureBudget) {
      textures_->textures.pop_back();
    }
    lastShown_ = picture;
    return &textures_->textures.front();
  }
  if (frame.state == ImageSequenceDecoder::State::Failed) {
    const std::filesystem::path file = decoder_->sequence().fileForFrame(picture);
    if (missingFiles_.insert(file).second) {
      logWarningf("card \"%s\": %s; showing the last good picture", name(), frame.error);
    }
  }
  // Not decoded yet, or not decodable: the last picture shown stands in.
  return lastShown_ >= 0 && lastShown_ != picture ? cachedTexture(lastShown_) : nullptr;
}

void AnimatedCard::drawGLWithOptions(const RenderOptions& options) {
  // The editor never waits for a picture; a rendered frame must show the
  // picture of its own time.
  const bool editor = options.isYes(kRenderOptionEditor);
  const float halfHeight = cardHeight_ * 0.5f;
  const float halfWidth = halfHeight * aspect();
  const Texture* texture = textureForDrawing(!editor);
  if (texture == nullptr) {
    if (editor) {
      // Where the card is, while it has nothing to show.
      glPushAttrib(GL_ENABLE_BIT | GL_CURRENT_BIT);
      glDisable(GL_LIGHTING);
      glColor3f(0.6f, 0.6f, 0.6f);
      glBegin(GL_LINE_LOOP);
      glVertex3f(-halfWidth, -halfHeight, 0.0f);
      glVertex3f(halfWidth, -halfHeight, 0.0f);
      glVertex3f(halfWidth, halfHeight, 0.0f);
      glVertex3f(-halfWidth, halfHeight, 0.0f);
      glEnd();
      glPopAttrib();
    }
    return;
  }
  glPushAttrib(GL_ENABLE_BIT | GL_COLOR_BUFFER_BIT | GL_TEXTURE_BIT | GL_CURRENT_BIT);
  glDisable(GL_LIGHTING);
  glEnable(GL_TEXTURE_2D);
  glBindTexture(GL_TEXTURE_2D, texture->name.get());
  glTexEnvi(GL_TEXTURE_ENV, GL_TEXTURE_ENV_MODE, GL_MODULATE);
  // Pictures with transparency and cards below full opacity blend over
  // what is behind them; an opaque picture at opacity 1 comes out as it is.
  glEnable(GL_BLEND);
  glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
  if (enableFog()) {
    glEnable(GL_FOG);
  }
  glColor4f(1.0f, 1.0f, 1.0f, opacity_);
  // The texture holds the picture's top row first, at t = 0.
  glBegin(GL_QUADS);
  glNormal3f(0.0f, 0.0f, 1.0f);
  glTexCoord2f(0.0f, 1.0f);
  glVertex3f(-halfWidth, -halfHeight, 0.0f);
  glTexCoord2f(1.0f, 1.0f);
  glVertex3f(halfWidth, -halfHeight, 0.0f);
  glTexCoord2f(1.0f, 0.0f);
  glVertex3f(halfWidth, halfHeight, 0.0f);
  glTexCoord2f(0.0f, 0.0f);
  glVertex3f(-halfWidth, halfHeight, 0.0f);
  glEnd();
  glBindTexture(GL_TEXTURE_2D, 0);
  glPopAttrib();
}

// --- timeline, undo, archive

void AnimatedCard::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  AnimatedLayer::getAnimatablePropsInArray(tracks);
  tracks.push_back(
      std::make_shared<FloatValueTrack>(weak_from_this().lock(), "opacity", "Opacity"));
}

void AnimatedCard::addObserversForDocument(MyDocument* document) {
  AnimatedLayer::addObserversForDocument(document);
  addUndoObservers(document, kUndoableKeys);
}

void AnimatedCard::removeObserversForDocument(MyDocument* document) {
  removeUndoObservers(document, kUndoableKeys);
  AnimatedLayer::removeObserversForDocument(document);
}

void AnimatedCard::encodeWithCoder(KeyedArchiver& coder) const {
  AnimatedLayer::encodeWithCoder(coder);
  coder.encodeString(imagePath_, "imagePath");
  coder.encodeFloat(cardHeight_, "cardHeight");
  coder.encodeFloat(opacity_, "opacity");
  coder.encodeInt32(frameOffset_, "frameOffset");
  coder.encodeFloat(frame_, "frame");
}

void AnimatedCard::initWithCoder(KeyedUnarchiver& coder) {
  AnimatedLayer::initWithCoder(coder);
  imagePath_ = coder.decodeStringForKey("imagePath");
  const float height =
      coder.containsValueForKey("cardHeight") ? coder.decodeFloatForKey("cardHeight") : 1.0f;
  cardHeight_ = std::max(finiteOr(height, 1.0f), 0.0f);
  const float opacity =
      coder.containsValueForKey("opacity") ? coder.decodeFloatForKey("opacity") : 1.0f;
  opacity_ = std::clamp(finiteOr(opacity, 1.0f), 0.0f, 1.0f);
  frameOffset_ = coder.decodeInt32ForKey("frameOffset");
  frame_ = finiteOr(coder.decodeFloatForKey("frame"), 0.0f);
  if (!coder.hasFailed()) {
    // The archived frame count is what the pictures were; the folder says
    // what they are now.
    findSequence();
  }
}

}  // namespace cloudreel
