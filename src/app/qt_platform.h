#pragma once
// The core's platform services on Qt: the main run loop driven from Qt's
// event loop, and the user's dialogs as Qt message boxes and file dialogs.

#include <QObject>
#include <QTimer>
#include <functional>

#include "platform/run_loop.h"
#include "platform/user_interaction.h"

class QFileDialog;
class QWidget;

namespace cloudreel::app {

// Runs the core loop's tasks and timers on the GUI thread: a post from any
// thread queues a pass of the loop into Qt's event queue, and after each
// pass a single-shot timer waits for the next core timer.
class RunLoopBridge : public QObject {
  Q_OBJECT
 public:
  explicit RunLoopBridge(RunLoop& loop);
  ~RunLoopBridge() override;

 private:
  void pass();
  void scheduleNextTimer();

  RunLoop& loop_;
  QTimer timer_;
};

// Dialogs parented to the active window (none when there is none).
class QtUserInteraction final : public UserInteraction {
 public:
  // Called with every open panel before it runs, to add controls of its own
  // (the import commands' options).
  void setOpenPanelHook(std::function<void(QFileDialog&)> hook) {
    openPanelHook_ = std::move(hook);
  }

  void presentError(const Error& error) override;
  int runAlert(const Alert& alert) override;
  std::optional<std::string> runOpenPanel(const OpenPanel& panel) override;
  std::optional<std::string> runSavePanel(const SavePanel& panel) override;
  void beep() override;

 private:
  std::function<void(QFileDialog&)> openPanelHook_;
};

}  // namespace cloudreel::app
