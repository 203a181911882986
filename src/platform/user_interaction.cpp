#include "platform/user_interaction.h"

#include "platform/log.h"

namespace cloudreel {
namespace {

std::shared_ptr<UserInteraction>& installed() {
  static std::shared_ptr<UserInteraction> ui;
  return ui;
}

}  // namespace

UserInteraction& UserInteraction::shared() {
  static LoggingUserInteraction fallback;
  return installed() ? *installed() : fallback;
}

std::shared_ptr<UserInteraction> UserInteraction::setShared(std::shared_ptr<UserInteraction> ui) {
  std::shared_ptr<UserInteraction> previous = std::move(installed());
  installed() = std::move(ui);
  return previous;
}

void LoggingUserInteraction::presentError(const Error& error) {
  logErrorf("error: %s (%s %d)", error.message, error.domain, error.code);
}

int LoggingUserInteraction::runAlert(const Alert& alert) {
  if (alert.informativeText.empty()) {
    logWarningf("%s", alert.messageText);
  } else {
    logWarningf("%s: %s", alert.messageText, alert.informativeText);
  }
  return 0;
}

std::optional<std::string> LoggingUserInteraction::runOpenPanel(const OpenPanel& panel) {
  logf("%s: no file can be chosen here; cancelled", panel.title);
  return std::nullopt;
}

std::optional<std::string> LoggingUserInteraction::runSavePanel(const SavePanel& panel) {
  logf("%s: nowhere to save can be chosen here; cancelled", panel.title);
  return std::nullopt;
}

void LoggingUserInteraction::beep() { logf("beep"); }

}  // namespace cloudreel
