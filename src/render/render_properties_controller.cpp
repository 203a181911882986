#include "render/render_properties_controller.h"

#include <fmt/printf.h>

#include <algorithm>
#include <cctype>

#include "platform/application_defaults.h"
#include "platform/user_defaults.h"

namespace cloudreel {
namespace {

bool equalIgnoringCase(std::string_view a, std::string_view b) {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](char x, char y) {
    return std::tolower(static_cast<unsigned char>(x)) ==
           std::tolower(static_cast<unsigned char>(y));
  });
}

}  // namespace

std::optional<int> resolutionPresetNamed(std::string_view label) {
  for (std::size_t i = 0; i < kResolutionPresets.size(); ++i) {
    if (equalIgnoringCase(kResolutionPresets[i].label, label)) {
      return static_cast<int>(i);
    }
  }
  return std::nullopt;
}

RenderPropertiesController::RenderPropertiesController()
    : width_(kResolutionPresets[0].width),
      height_(kResolutionPresets[0].height),
      outputPattern_(*FramePattern::parse("output_%04d.tiff")) {}

void RenderPropertiesController::setResolutionPreset(int index) {
  if (index < 0 || static_cast<std::size_t>(index) >= kResolutionPresets.size()) {
    return;
  }
  width_ = kResolutionPresets[static_cast<std::size_t>(index)].width;
  height_ = kResolutionPresets[static_cast<std::size_t>(index)].height;
}

void RenderPropertiesController::windowDidLoad() {
  outputPath_ = UserDefaults::standardUserDefaults().stringForKey(kImageSavePathKey);
}

void RenderProgressController::setProgress(float fraction) {
  barValue_ = static_cast<double>(fraction) * 100.0;
  label_ = fmt::sprintf("%0.0f%%", barValue_);
}

void RenderProgressController::setProgressFrameLastFrame(int frame, int lastFrame) {
  barValue_ = lastFrame == 0
                  ? 100.0
                  : static_cast<double>(static_cast<float>(frame) / static_cast<float>(lastFrame) *
                                        100.0f);
  label_ = fmt::sprintf("frame %d of %d", frame, lastFrame);
}

}  // namespace cloudreel
