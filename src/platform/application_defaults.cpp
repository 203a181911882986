#include "platform/application_defaults.h"

#include <string>

#include "platform/file_location.h"

namespace cloudreel {

std::unique_ptr<UserDefaults> useFactoryDefaultsInMemory() {
  auto previous = UserDefaults::setStandardUserDefaults(
      std::make_unique<UserDefaults>(std::make_unique<MemoryDefaultsStore>()));
  registerApplicationDefaults(UserDefaults::standardUserDefaults());
  return previous;
}

void registerApplicationDefaults(UserDefaults& defaults) {
  const std::string home = homeDirectory().string();
  auto colour = [](float r, float g, float b) {
    return DefaultsValue(Color::colorWithRGBA(r, g, b, 1.0f)->archivedData());
  };
  const DefaultsValue yellow = colour(1, 1, 0);
  defaults.registerDefaults({
      {std::string(kGridColorKey), colour(0, 1, 0)},
      {std::string(kPointColorKey), yellow},
      {std::string(kBackgroundColorKey), colour(0, 0, 0)},
      {std::string(kFrustumColorKey), yellow},
      {std::string(kSelectedFrustumColorKey), yellow},
      {std::string(kEmptyDocKey), true},
      {std::string(kTerminateAfterLastWindowClosedKey), false},
      {std::string(kPointSizeKey), 1.0},
      {std::string(kDefaultFPSKey), 25.0},
      {std::string(kDefaultFOVKey), 30.0},
      {std::string(kDefaultInterocularKey), 0.2},
      {std::string(kImageSavePathKey), home + "/rw_images"},
      {std::string(kPointCachePathKey), home + "/rw_points"},
  });
}

std::shared_ptr<Color> colorForDefaultsKey(const UserDefaults& defaults, std::string_view key) {
  const Bytes data = defaults.dataForKey(key);
  if (data.empty()) {
    return nullptr;
  }
  return Color::colorFromArchivedData(data, nullptr);
}

void setColorForDefaultsKey(UserDefaults& defaults, const Color& color, std::string_view key) {
  defaults.setObjectForKey(color.archivedData(), key);
}

}  // namespace cloudreel
