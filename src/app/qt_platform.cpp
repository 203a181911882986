#include "app/qt_platform.h"

#include <QApplication>
#include <QFileDialog>
#include <QFileInfo>
#include <QMessageBox>
#include <QPushButton>
#include <chrono>

namespace cloudreel::app {

// --- RunLoopBridge

RunLoopBridge::RunLoopBridge(RunLoop& loop) : loop_(loop) {
  timer_.setSingleShot(true);
  timer_.setTimerType(Qt::PreciseTimer);
  connect(&timer_, &QTimer::timeout, this, &RunLoopBridge::pass);
  loop_.setWakeHandler([this] {
    // Any thread: the pass runs on the GUI thread, in Qt's event order.
    QMetaObject::invokeMethod(this, &RunLoopBridge::pass, Qt::QueuedConnection);
  });
  QMetaObject::invokeMethod(this, &RunLoopBridge::pass, Qt::QueuedConnection);
}

RunLoopBridge::~RunLoopBridge() { loop_.setWakeHandler(nullptr); }

void RunLoopBridge::pass() {
  loop_.runPending();
  scheduleNextTimer();
}

void RunLoopBridge::scheduleNextTimer() {
  const auto wait = loop_.timeUntilNextTimer();
  if (!wait) {
    timer_.stop();
    return;
  }
  const auto ms = std::chrono::ceil<std::chrono::milliseconds>(*wait).count();
  timer_.start(static_cast<int>(std::min<long long>(ms, 24LL * 3600 * 1000)));
}

// --- QtUserInteraction

namespace {

QStringList nameFilters(const std::vector<std::string>& types) {
  if (types.empty()) {
    return {};
  }
  QString patterns;
  for (const auto& type : types) {
    patterns += QStringLiteral("*.%1 ").arg(QString::fromStdString(type));
  }
  return {patterns.trimmed(), QStringLiteral("All files (*)")};
}

}  // namespace

void QtUserInteraction::presentError(const Error& error) {
  QMessageBox box(QMessageBox::Warning, QStringLiteral("Cloudreel"),
                  QString::fromStdString(error.message), QMessageBox::Ok,
                  QApplication::activeWindow());
  box.exec();
}

int QtUserInteraction::runAlert(const Alert& alert) {
  QMessageBox box(QApplication::activeWindow());
  box.setText(QString::fromStdString(alert.messageText));
  box.setInformativeText(QString::fromStdString(alert.informativeText));
  std::vector<QPushButton*> buttons;
  const std::vector<std::string> titles =
      alert.buttons.empty() ? std::vector<std::string>{"OK"} : alert.buttons;
  for (const auto& title : titles) {
    buttons.push_back(box.addButton(QString::fromStdString(title), QMessageBox::ActionRole));
  }
  box.setDefaultButton(buttons.front());
  box.exec();
  for (std::size_t i = 0; i < buttons.size(); ++i) {
    if (box.clickedButton() == buttons[i]) {
      return static_cast<int>(i);
    }
  }
  return 0;
}

std::optional<std::string> QtUserInteraction::runOpenPanel(const OpenPanel& panel) {
  QFileDialog dialog(QApplication::activeWindow(), QString::fromStdString(panel.title));
  dialog.setAcceptMode(QFileDialog::AcceptOpen);
  dialog.setFileMode(panel.canChooseDirectories && !panel.canChooseFiles
                         ? QFileDialog::Directory
                         : QFileDialog::ExistingFile);
  dialog.setNameFilters(nameFilters(panel.allowedFileTypes));
  if (openPanelHook_) {
    openPanelHook_(dialog);
  }
  if (dialog.exec() != QDialog::Accepted || dialog.selectedFiles().isEmpty()) {
    return std::nullopt;
  }
  return dialog.selectedFiles().front().toStdString();
}

std::optional<std::string> QtUserInteraction::runSavePanel(const SavePanel& panel) {
  QFileDialog dialog(QApplication::activeWindow(), QString::fromStdString(panel.title));
  dialog.setAcceptMode(QFileDialog::AcceptSave);
  dialog.selectFile(QString::fromStdString(panel.nameFieldValue));
  if (!panel.requiredFileType.empty()) {
    dialog.setDefaultSuffix(QString::fromStdString(panel.requiredFileType));
    dialog.setNameFilters(nameFilters({panel.requiredFileType}));
  }
  if (dialog.exec() != QDialog::Accepted || dialog.selectedFiles().isEmpty()) {
    return std::nullopt;
  }
  return dialog.selectedFiles().front().toStdString();
}

void QtUserInteraction::beep() { QApplication::beep(); }

}  // namespace cloudreel::app
