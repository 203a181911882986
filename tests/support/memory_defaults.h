#pragma once
// The application's registered defaults held in memory for the life of the
// object, so a test neither reads nor changes the user's own settings.

#include <memory>

#include "platform/application_defaults.h"
#include "platform/user_defaults.h"

namespace cloudreel::testing {

struct MemoryDefaults {
  MemoryDefaults() : previous(useFactoryDefaultsInMemory()) {}
  ~MemoryDefaults() { UserDefaults::setStandardUserDefaults(std::move(previous)); }
  std::unique_ptr<UserDefaults> previous;
};

}  // namespace cloudreel::testing
