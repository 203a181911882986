#include "app/import_options_panel.h"

#include <QCheckBox>
#include <QFileDialog>
#include <QGridLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QSpinBox>
#include <QStackedWidget>
#include <QVBoxLayout>

#include "platform/user_defaults.h"

namespace cloudreel::app {

namespace {

// A check box that stores its state under `key` whenever it is clicked.
QCheckBox* defaultsCheckBox(const QString& title, std::string_view key) {
  auto* box = new QCheckBox(title);
  box->setChecked(UserDefaults::standardUserDefaults().boolForKey(key));
  QObject::connect(box, &QCheckBox::toggled, box, [key = std::string(key)](bool on) {
    UserDefaults::standardUserDefaults().setObjectForKey(on, key);
  });
  return box;
}

QWidget* page(std::initializer_list<QWidget*> rows) {
  auto* widget = new QWidget;
  auto* layout = new QVBoxLayout(widget);
  layout->setContentsMargins(0, 4, 0, 4);
  for (QWidget* row : rows) {
    layout->addWidget(row);
  }
  layout->addStretch();
  return widget;
}

const QString kLinkTitle = QStringLiteral("Link to the file instead of copying its points");

}  // namespace

ImportOptionsPanel::ImportOptionsPanel(ViewForSelection viewForSelection, QWidget* parent)
    : QWidget(parent), viewForSelection_(std::move(viewForSelection)) {
  pages_ = new QStackedWidget;
  // In the order of ImportOptionsView: None shows an empty page.
  pages_->addWidget(new QWidget);
  pages_->addWidget(pointFilePage());
  pages_->addWidget(bundlerPage());
  pages_->addWidget(plyPage());
  pages_->addWidget(cardPage());
  auto* layout = new QVBoxLayout(this);
  layout->setContentsMargins(0, 0, 0, 0);
  layout->addWidget(pages_);
  showOptionsForSelection({});
}

QWidget* ImportOptionsPanel::pointFilePage() {
  linkPointFile_ = defaultsCheckBox(kLinkTitle, kOpenRWBFileAsReferenceKey);
  return page({linkPointFile_});
}

QWidget* ImportOptionsPanel::bundlerPage() {
  linkBundle_ = defaultsCheckBox(kLinkTitle, kOpenPointFileAsReferenceKey);
  return page({linkBundle_});
}

QWidget* ImportOptionsPanel::plyPage() {
  // A PLY layer always keeps its points in the document: the link box is
  // there to say so, not to be changed.
  QCheckBox* link = defaultsCheckBox(kLinkTitle, kOpenPLYFileAsReferenceKey);
  link->setEnabled(false);
  link->setToolTip(QStringLiteral("PLY layers keep their points in the document"));

  plyDownsample_ =
      defaultsCheckBox(QStringLiteral("Keep one vertex in every"), kOpenPLYDownsampleKey);
  plyFactor_ = new QSpinBox;
  plyFactor_->setRange(1, 1'000'000);
  const std::int64_t factor =
      UserDefaults::standardUserDefaults().integerForKey(kOpenPLYDownsampleFactorKey);
  plyFactor_->setValue(static_cast<int>(std::clamp<std::int64_t>(factor, 1, 1'000'000)));
  connect(plyFactor_, &QSpinBox::valueChanged, this, [](int value) {
    UserDefaults::standardUserDefaults().setObjectForKey(std::int64_t{value},
                                                         kOpenPLYDownsampleFactorKey);
  });
  auto* downsampleRow = new QWidget;
  auto* row = new QHBoxLayout(downsampleRow);
  row->setContentsMargins(0, 0, 0, 0);
  row->addWidget(plyDownsample_);
  row->addWidget(plyFactor_);
  row->addStretch();
  return page({link, downsampleRow});
}

QWidget* ImportOptionsPanel::cardPage() {
  return page({defaultsCheckBox(QStringLiteral("Show the numbered sequence the picture belongs to"),
                                kOpenCardAsSequenceKey)});
}

void ImportOptionsPanel::attachTo(QFileDialog& dialog) {
  dialog.setOption(QFileDialog::DontUseNativeDialog);
  if (auto* grid = qobject_cast<QGridLayout*>(dialog.layout())) {
    grid->addWidget(this, grid->rowCount(), 0, 1, grid->columnCount());
  } else {
    dialog.layout()->addWidget(this);
  }
  connect(&dialog, &QFileDialog::currentChanged, this,
          [this](const QString& path) { showOptionsForSelection(path.toStdString()); });
}

void ImportOptionsPanel::showOptionsForSelection(const std::filesystem::path& selected) {
  shown_ = viewForSelection_ ? viewForSelection_(selected) : ImportOptionsView::None;
  pages_->setCurrentIndex(static_cast<int>(shown_));
}

}  // namespace cloudreel::app
