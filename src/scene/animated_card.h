#pragma once
// A picture on a card: a quad in the layer's x-y plane, facing +z and
// centred on the layer's origin, showing one image or a numbered image
// sequence (a folder of numbered files, or a printf-style pattern such as
// shot_%04d.png). The card is as high as its height property and as wide
// as the first picture's aspect makes it.
//
// The timeline's "Time" track turns seconds into the card's frame at the
// card's frame rate; the picture shown is that frame plus the frame offset,
// held at the first picture before the sequence and at the last after it.
//
// Pictures are decoded on worker threads, a few ahead of the one shown,
// and only a few are kept, decoded or as textures, so a sequence of any
// length plays in the same memory. The interactive view never waits for a
// picture: until it is decoded the card keeps showing the last one it had.
// Off-screen renders wait for exactly the picture of their frame. A frame
// whose file is missing or unreadable shows the last good picture, and the
// file is named in the log once.

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "scene/layer.h"

namespace cloudreel {

class ImageSequenceDecoder;

class AnimatedCard : public AnimatedLayer {
 public:
  // Textures kept at most, the one shown included.
  static constexpr int kTextureBudget = 4;
  // Decoded pictures kept at most, the one shown and those just after it.
  static constexpr int kDecodeBudget = 6;

  // "Card", without pictures, height 1, opaque, no offset, frame 0.
  AnimatedCard();
  ~AnimatedCard() override;

  std::string_view className() const override { return "AnimatedCard"; }
  const PropertyTable& properties() const override;

  // A picture file, a folder of numbered pictures or a pattern. Setting it
  // finds the frames (nFrames becomes their number) and reads the first
  // picture's size; a source that gives no frame leaves the card without
  // pictures and sourceError() says why.
  const std::string& imagePath() const { return imagePath_; }
  void setImagePath(std::string path);
  // Why the source gives no pictures; empty when it does (or is empty).
  const std::string& sourceError() const { return sourceError_; }
  bool hasImages() const { return decoder_ != nullptr; }
  // The first picture's size in pixels; 0 × 0 without pictures.
  int imageWidth() const { return imageWidth_; }
  int imageHeight() const { return imageHeight_; }
  // Width over height of the first picture; 1 without one.
  float aspect() const;

  // The card's height in the layer's units (never negative); its width is
  // height × aspect.
  float cardHeight() const { return cardHeight_; }
  void setCardHeight(float v);
  float opacity() const { return opacity_; }
  void setOpacity(float v);
  // Added to the frame before it picks a picture.
  std::int32_t frameOffset() const { return frameOffset_; }
  void setFrameOffset(std::int32_t v) { changeValueForKey("frameOffset", frameOffset_, v); }
  // The current frame of the card's own animation (the "Time" track's key).
  float frame() const { return frame_; }
  void setFrame(float v);
  // seconds × FPS.
  void setFrameForTime(float seconds) override;
  // The picture the frame shows: floor(frame) + frameOffset, held within
  // the sequence.
  int pictureIndex() const;
  // The file of that picture; empty without pictures.
  std::filesystem::path pictureFile() const;

  // The quad with the picture; without pictures, in the editor only, its
  // outline.
  void drawGLWithOptions(const RenderOptions& options) override;
  // Textures and decoded pictures held now (for the memory checks).
  int texturesHeld() const;
  int picturesDecoded() const;
  // The files found missing or unreadable so far, each named once.
  const std::set<std::filesystem::path>& missingFiles() const { return missingFiles_; }

  // The layer's "Transform" and "Time" tracks, then "Opacity".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  // Also makes the document observe the source, height, opacity, offset
  // and frame rate for undo.
  void addObserversForDocument(MyDocument* document) override;
  void removeObserversForDocument(MyDocument* document) override;

  // After the animated layer's keys: "imagePath" (string), "cardHeight",
  // "opacity", "frame" (floats) and "frameOffset" (int32). The sequence is
  // found again from the path when the document opens; missing pictures
  // leave the card empty, not the document unreadable.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The animated layer's copy, then the source, height, opacity, offset and
  // frame; the copy decodes for itself.
  void copyInto(Animatable3DObject& target) const override;

 private:
  struct Texture;
  // Textures of the last pictures shown, most recently used first.
  struct TextureCache;
  void findSequence();
  // The texture of the picture to draw now, uploading it when it has just
  // been decoded; null when there is none yet.
  const Texture* textureForDrawing(bool wait);
  const Texture* cachedTexture(int picture);

  std::string imagePath_;
  std::string sourceError_;
  float cardHeight_ = 1.0f;
  float opacity_ = 1.0f;
  std::int32_t frameOffset_ = 0;
  float frame_ = 0.0f;
  int imageWidth_ = 0;
  int imageHeight_ = 0;
  std::unique_ptr<ImageSequenceDecoder> decoder_;
  std::unique_ptr<TextureCache> textures_;
  // The picture shown last; its texture is kept while later ones decode.
  int lastShown_ = -1;
  std::set<std::filesystem::path> missingFiles_;
  // Shared with the decoder's workers: set while a redraw is on its way to
  // the main loop, so a burst of decoded pictures asks for one redraw.
  std::shared_ptr<std::atomic<bool>> redrawPending_;
};

}  // namespace cloudreel
