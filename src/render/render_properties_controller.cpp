#include "render/render_properties_controller.h"

#include <fmt/printf.h>

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <system_error>

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

bool RenderPropertiesController::prepareForRender(Error* error) const {
  if (width_ <= 0 || height_ <= 0) {
    setError(
        error, "Render", 1,
        fmt::sprintf("A render of %d × %d has no pixels; choose a larger size.", width_, height_));
    return false;
  }
  if (outputPath_.empty()) {
    setError(error, "Render", 2, "Choose a folder for the rendered frames.");
    return false;
  }
  const std::filesystem::path folder(outputPath_);
  std::error_code code;
  if (std::filesystem::is_directory(folder, code)) {
    return true;
  }
  if (std::filesystem::exists(folder, code)) {
    setError(
        error, "Render", 3,
        fmt::sprintf("The frames cannot go into %s: it is a file, not a folder.", outputPath_));
    return false;
  }
  if (!std::filesystem::create_directories(folder, code) || code) {
    setError(error, "Render", 4,
             fmt::sprintf("The folder %s for the frames cannot be made: %s", outputPath_,
                          code ? code.message() : std::string("unknown error")));
    return false;
  }
  return true;
}

void RenderProgressController::setProgress(float fraction) {
  barValue_ = static_cast<double>(fraction) * 100.0;
  label_ = fmt::sprintf("%0.0f%%", barValue_);
  changed();
}

void RenderProgressController::setProgressFrameLastFrame(int frame, int lastFrame) {
  barValue_ =
      lastFrame == 0
          ? 100.0
          : static_cast<double>(static_cast<float>(frame) / static_cast<float>(lastFrame) * 100.0f);
  label_ = fmt::sprintf("frame %d of %d", frame, lastFrame);
  changed();
}

void RenderProgressController::cancelButtonClicked() {
  hasCancelled_ = true;
  changed();
}

void RenderProgressController::changed() const {
  if (changed_) {
    changed_();
  }
}

}  // namespace cloudreel
