#pragma once
// The application's registered defaults held in memory for the life of the
// object, so a test neither reads nor changes the user's own settings.

#include <memory>

#include "platform/application_defaults.h"
#include "platform/user_defaults.h"

namespace cloudreel::testing {

struct MemoryDefaults {
  MemoryDefaults()
      : previous(UserDefaults::setStandardUserDefaults(
            std::make_unique<UserDefaults>(std::make_unique<MemoryDefaultsStore>()))) {
    registerApplicationDefaults(UserDefaults::standardUserDefaults());
  }
  ~MemoryDefaults() { UserDefaults::setStandardUserDefaults(std::move(previous)); }
  std::unique_ptr<UserDefaults> previous;
};

}  // namespace cloudreel::testing
