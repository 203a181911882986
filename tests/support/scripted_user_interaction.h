#pragma once
// The test double for the user: answers alerts and open panels from a script
// and records everything it was shown.

#include <deque>
#include <optional>
#include <string>
#include <vector>

#include "platform/user_interaction.h"

namespace cloudreel::testing {

class ScriptedUserInteraction : public UserInteraction {
 public:
  // Answers the next alert with this button index, in order; with the script
  // empty, alerts answer 0 (the default button).
  void answerAlertsWith(std::initializer_list<int> buttons) {
    alertAnswers_.insert(alertAnswers_.end(), buttons);
  }
  // The next open panel chooses this path, or cancels for nullopt.
  void answerOpenPanelWith(std::optional<std::string> path) {
    panelAnswers_.push_back(std::move(path));
  }

  // The next save panel chooses this path, or cancels for nullopt.
  void answerSavePanelWith(std::optional<std::string> path) {
    savePanelAnswers_.push_back(std::move(path));
  }

  void presentError(const Error& error) override { errors.push_back(error); }
  int runAlert(const Alert& alert) override {
    alerts.push_back(alert);
    if (alertAnswers_.empty()) {
      return 0;
    }
    const int answer = alertAnswers_.front();
    alertAnswers_.pop_front();
    return answer;
  }
  std::optional<std::string> runOpenPanel(const OpenPanel& panel) override {
    panels.push_back(panel);
    if (panelAnswers_.empty()) {
      return std::nullopt;
    }
    auto answer = std::move(panelAnswers_.front());
    panelAnswers_.pop_front();
    return answer;
  }
  std::optional<std::string> runSavePanel(const SavePanel& panel) override {
    savePanels.push_back(panel);
    if (savePanelAnswers_.empty()) {
      return std::nullopt;
    }
    auto answer = std::move(savePanelAnswers_.front());
    savePanelAnswers_.pop_front();
    return answer;
  }
  void beep() override { ++beeps; }

  std::vector<Error> errors;
  std::vector<Alert> alerts;
  std::vector<OpenPanel> panels;
  std::vector<SavePanel> savePanels;
  int beeps = 0;

 private:
  std::deque<int> alertAnswers_;
  std::deque<std::optional<std::string>> panelAnswers_;
  std::deque<std::optional<std::string>> savePanelAnswers_;
};

}  // namespace cloudreel::testing
