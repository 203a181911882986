#pragma once
// What the core must ask or tell the user: an error, an alert with buttons,
// an open panel, the beep of a refused command. The Qt shell shows real
// dialogs, the command line answers from its options and prints, and tests
// script the answers.

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/error.h"

namespace cloudreel {

struct Alert {
  std::string messageText;
  std::string informativeText;
  // Titles left to right; the first is the default button. No titles means
  // one "OK" button.
  std::vector<std::string> buttons;
};

struct OpenPanel {
  std::string title;
  bool canChooseFiles = true;
  bool canChooseDirectories = false;
  // Extensions without the dot; empty allows every file.
  std::vector<std::string> allowedFileTypes;
};

struct SavePanel {
  std::string title;
  // The name the panel proposes.
  std::string nameFieldValue;
  // The extension (without the dot) a chosen name is given when it has
  // none; empty for any.
  std::string requiredFileType;
};

class UserInteraction {
 public:
  virtual ~UserInteraction() = default;

  virtual void presentError(const Error& error) = 0;
  // Answers the index of the pressed button in alert.buttons (0 for the
  // first, the default).
  virtual int runAlert(const Alert& alert) = 0;
  // Answers the chosen path, or nothing when the user cancels.
  virtual std::optional<std::string> runOpenPanel(const OpenPanel& panel) = 0;
  // Answers the path to save to, or nothing when the user cancels.
  virtual std::optional<std::string> runSavePanel(const SavePanel& panel) = 0;
  // The system beep: a command that cannot be carried out as things stand
  // (a cut without both marks) says so without a dialog.
  virtual void beep() = 0;

  // The process-wide front end; tests and the command line install theirs.
  // Until one is installed, errors and alerts are logged, alerts answer their
  // default button and open panels cancel.
  static UserInteraction& shared();
  // Installs a front end and answers the previous one (null for the
  // built-in logging one).
  static std::shared_ptr<UserInteraction> setShared(std::shared_ptr<UserInteraction> ui);
};

// The built-in front end for headless use: writes errors and alerts to the
// log, answers alerts with their default button and cancels open and save
// panels; a beep is a debug line.
class LoggingUserInteraction final : public UserInteraction {
 public:
  void presentError(const Error& error) override;
  int runAlert(const Alert& alert) override;
  std::optional<std::string> runOpenPanel(const OpenPanel& panel) override;
  std::optional<std::string> runSavePanel(const SavePanel& panel) override;
  void beep() override;
};

}  // namespace cloudreel
