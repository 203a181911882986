#pragma once
// The settings of a render, as the settings sheet offers them: the output
// size (from a table of presets), the stereo pair, the depth image, the
// range, the folder and the file-name pattern. The sheet is a window of the
// application; what it holds and decides lives here, so the command line
// renders with the same defaults.

#include <array>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/error.h"
#include "render/frame_pattern.h"

namespace cloudreel {

struct ResolutionPreset {
  std::string_view label;
  int width;
  int height;
};

// The presets, by index. "720p" is 1440 × 720, wider than the usual
// 1280 × 720; documents and scripts rely on that size, so it stays.
inline constexpr std::array<ResolutionPreset, 11> kResolutionPresets{{
    {"720p", 1440, 720},
    {"1080p", 1920, 1080},
    {"480p", 720, 480},
    {"PAL Square Pixel", 768, 576},
    {"1600p", 2560, 1600},
    {"2k 16:9", 2048, 1152},
    {"4k 16:9", 4096, 2304},
    {"1024x768", 1024, 768},
    {"iPad retina", 2048, 1536},
    {"Wu-TangXGA", 1920, 1200},
    {"WQHD", 2560, 1440},
}};

// The index of the preset whose label matches, ignoring case.
std::optional<int> resolutionPresetNamed(std::string_view label);

// Which frames the render covers: the range selector's tag.
enum class RenderRange : int { WholeTimeline = 1, Marks = 2 };

class RenderPropertiesController {
 public:
  RenderPropertiesController();

  int width() const { return width_; }
  int height() const { return height_; }
  void setWidth(int v) { width_ = v; }
  void setHeight(int v) { height_ = v; }
  // Sets the size of preset `index`; any index outside the table changes
  // nothing.
  void setResolutionPreset(int index);

  float zNear() const { return zNear_; }
  float zFar() const { return zFar_; }
  void setZNear(float v) { zNear_ = v; }
  void setZFar(float v) { zFar_ = v; }
  bool renderInStereo() const { return renderInStereo_; }
  void setRenderInStereo(bool v) { renderInStereo_ = v; }
  float stereoSeparation() const { return stereoSeparation_; }
  void setStereoSeparation(float v) { stereoSeparation_ = v; }
  // Offered by the sheet; the renderer draws every stereo type the same.
  int stereoType() const { return stereoType_; }
  void setStereoType(int v) { stereoType_ = v; }
  const FramePattern& outputPattern() const { return outputPattern_; }
  void setOutputPattern(FramePattern v) { outputPattern_ = std::move(v); }
  const std::string& outputPath() const { return outputPath_; }
  void setOutputPath(std::string v) { outputPath_ = std::move(v); }
  bool shouldRenderDepth() const { return shouldRenderDepth_; }
  void setShouldRenderDepth(bool v) { shouldRenderDepth_ = v; }
  // The selector's tag: 1 the whole timeline; any other value the marks.
  int renderRangeSelected() const { return renderRangeSelected_; }
  void setRenderRangeSelected(int tag) { renderRangeSelected_ = tag; }

  // The folder starts as the user default KTImageSavePath when the sheet's
  // window loads.
  void windowDidLoad();

  // Makes sure the frames can go where the settings say before a render
  // starts: the output folder is created when missing (the default one
  // usually is, on a new account). False, with an error naming the folder,
  // when no folder is given, a file stands in its place or it cannot be
  // made; also for a size without pixels.
  [[nodiscard]] bool prepareForRender(Error* error = nullptr) const;

 private:
  int width_;
  int height_;
  float zNear_ = 1.0f;
  float zFar_ = 30.0f;
  bool renderInStereo_ = false;
  float stereoSeparation_ = 0.2f;
  int stereoType_ = 0;
  FramePattern outputPattern_;
  std::string outputPath_;
  bool shouldRenderDepth_ = false;
  int renderRangeSelected_ = static_cast<int>(RenderRange::WholeTimeline);
};

// The progress of a render as its sheet shows it: a bar from 0 to 100, a
// label, and whether the user pressed cancel. A sheet showing it sets a
// change handler to hear of every new bar value and label, so it never polls.
class RenderProgressController {
 public:
  // Called after every change of the bar, the label or the cancel flag;
  // null for none.
  void setChangeHandler(std::function<void()> handler) { changed_ = std::move(handler); }

  // The bar at fraction × 100, the label "%0.0f%%" of it.
  void setProgress(float fraction);
  // The bar at frame / lastFrame × 100, the label "frame %d of %d". A last
  // frame of 0 would divide by zero: the bar then shows 100 (the only frame
  // is the last one).
  void setProgressFrameLastFrame(int frame, int lastFrame);

  double barValue() const { return barValue_; }
  const std::string& label() const { return label_; }
  bool hasCancelled() const { return hasCancelled_; }
  void cancelButtonClicked();

 private:
  void changed() const;

  std::function<void()> changed_;
  double barValue_ = 0.0;
  std::string label_;
  bool hasCancelled_ = false;
};

}  // namespace cloudreel
