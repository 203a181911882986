#pragma once
// The application's registered preferences: display colours, point size,
// frame rate, field of view, interocular distance and the two folders.
// Colours are stored as the archive of a colour object.

#include <memory>
#include <string_view>

#include "platform/color.h"
#include "platform/user_defaults.h"

namespace cloudreel {

inline constexpr std::string_view kGridColorKey = "KTGridColor";
inline constexpr std::string_view kPointColorKey = "KTPointColor";
inline constexpr std::string_view kBackgroundColorKey = "KTBackgroundColor";
inline constexpr std::string_view kFrustumColorKey = "KTFrustumColor";
inline constexpr std::string_view kSelectedFrustumColorKey = "KTSelectedFrustumColor";
inline constexpr std::string_view kEmptyDocKey = "KTEmptyDoc";
inline constexpr std::string_view kTerminateAfterLastWindowClosedKey =
    "KTTerminateAfterLastWindowClosed";
inline constexpr std::string_view kPointSizeKey = "KTPointSize";
inline constexpr std::string_view kDefaultFPSKey = "KTDefaultFPS";
inline constexpr std::string_view kDefaultFOVKey = "KTDefaultFOV";
inline constexpr std::string_view kDefaultInterocularKey = "KTDefaultInterocular";
inline constexpr std::string_view kImageSavePathKey = "KTImageSavePath";
inline constexpr std::string_view kPointCachePathKey = "KTPointCachePath";

// Registers the factory settings; registering again changes nothing.
void registerApplicationDefaults(UserDefaults& defaults);

// Makes the standard defaults a fresh store in memory holding the factory
// settings and answers the defaults it replaced: for programs that must
// neither read nor change the user's own settings (tests, benchmarks,
// fuzzers).
std::unique_ptr<UserDefaults> useFactoryDefaultsInMemory();

// The colour archived under a key; null when the key holds no valid colour.
std::shared_ptr<Color> colorForDefaultsKey(const UserDefaults& defaults, std::string_view key);
void setColorForDefaultsKey(UserDefaults& defaults, const Color& color, std::string_view key);

}  // namespace cloudreel
