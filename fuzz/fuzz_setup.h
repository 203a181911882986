#pragma once
// What every fuzz target does once before its first input: the factory
// settings in memory, so no user's configuration is read, and a silent log,
// since the readers log every refusal (and a failed import presents its
// error through the log).

#include <memory>
#include <string_view>

#include "platform/application_defaults.h"
#include "platform/log.h"
#include "platform/user_defaults.h"

namespace cloudreel::fuzz {

inline void useFactoryDefaultsAndSilentLog() {
  (void)useFactoryDefaultsInMemory();
  setLogSink([](std::string_view) {});
}

}  // namespace cloudreel::fuzz
