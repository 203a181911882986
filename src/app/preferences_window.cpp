#include "app/preferences_window.h"

#include <QColorDialog>
#include <QFormLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QPushButton>

#include "platform/application_defaults.h"
#include "platform/color.h"
#include "platform/user_defaults.h"

namespace cloudreel::app {

namespace {

const char* const kWellTitles[] = {"Grid", "Points", "Background", "Camera frustums",
                                   "Selected camera frustum"};

QColor qColor(const Color& color) {
  return QColor::fromRgbF(color.red(), color.green(), color.blue(), color.alpha());
}

}  // namespace

PreferencesWindow::PreferencesWindow() {
  setWindowTitle(QStringLiteral("Preferences"));
  auto* layout = new QFormLayout(this);
  for (std::size_t i = 0; i < wells_.size(); ++i) {
    wells_[i] = new QPushButton;
    wells_[i]->setFixedWidth(64);
    const PreferenceController::Well well = PreferenceController::kWells[i];
    connect(wells_[i], &QPushButton::clicked, this, [this, well] { chooseColor(well); });
    layout->addRow(QString::fromUtf8(kWellTitles[i]), wells_[i]);
  }
  auto folderRow = [&](const QString& title, QLabel*& label, auto choose) {
    auto* row = new QHBoxLayout;
    label = new QLabel;
    auto* button = new QPushButton(QStringLiteral("Choose…"));
    connect(button, &QPushButton::clicked, this, [this, choose] {
      choose(controller_);
      showFolders();
    });
    row->addWidget(label, 1);
    row->addWidget(button);
    layout->addRow(title, row);
  };
  folderRow(QStringLiteral("Rendered images"), imageFolder_,
            [](PreferenceController& c) { c.changeImagePath(); });
  folderRow(QStringLiteral("Point cache"), cacheFolder_,
            [](PreferenceController& c) { c.changePointProxyPath(); });
  showWells();
  showFolders();
}

void PreferencesWindow::showWells() {
  const auto colors = controller_.wellColors();
  for (std::size_t i = 0; i < wells_.size(); ++i) {
    const QColor color = colors[i] ? qColor(*colors[i]) : QColor(Qt::black);
    wells_[i]->setStyleSheet(QStringLiteral("background-color: %1").arg(color.name()));
  }
}

void PreferencesWindow::showFolders() {
  const UserDefaults& defaults = UserDefaults::standardUserDefaults();
  imageFolder_->setText(QString::fromStdString(defaults.stringForKey(kImageSavePathKey)));
  cacheFolder_->setText(QString::fromStdString(defaults.stringForKey(kPointCachePathKey)));
}

void PreferencesWindow::chooseColor(PreferenceController::Well well) {
  const auto current = PreferenceController::prefsColorNamed(PreferenceController::keyForWell(well));
  const QColor chosen = QColorDialog::getColor(current ? qColor(*current) : QColor(Qt::white), this,
                                               QStringLiteral("Colour"),
                                               QColorDialog::ShowAlphaChannel);
  if (!chosen.isValid()) {
    return;
  }
  controller_.changePrefsColorFromColorWell(
      Color(static_cast<float>(chosen.redF()), static_cast<float>(chosen.greenF()),
            static_cast<float>(chosen.blueF()), static_cast<float>(chosen.alphaF())),
      well);
  showWells();
}

}  // namespace cloudreel::app
