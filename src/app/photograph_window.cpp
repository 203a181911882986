#include "app/photograph_window.h"

#include <QLabel>
#include <QPixmap>
#include <QResizeEvent>
#include <QVBoxLayout>

namespace cloudreel::app {

PhotographWindow::PhotographWindow(std::shared_ptr<MyDocument> frontDocument, QWidget* parent)
    : QWidget(parent, Qt::Tool) {
  setWindowTitle(QStringLiteral("Photograph"));
  auto* layout = new QVBoxLayout(this);
  label_ = new QLabel;
  label_->setAlignment(Qt::AlignCenter);
  // The picture follows the window's size, never the other way round.
  label_->setSizePolicy(QSizePolicy::Ignored, QSizePolicy::Ignored);
  label_->setWordWrap(true);
  layout->addWidget(label_);
  resize(480, 360);
  controller_.setReloadHandler([this] { reload(); });
  controller_.setDocument(frontDocument);
  reload();
}

QString PhotographWindow::message() const { return image_.isNull() ? label_->text() : QString(); }

void PhotographWindow::reload() {
  const auto camera = controller_.selectedCamera();
  const auto path = controller_.photographPath();
  if (shown_ && *shown_ == path && shownCamera_ == camera) {
    return;
  }
  shown_ = path;
  shownCamera_ = camera;
  image_ = QImage();
  if (!camera) {
    label_->setText(QStringLiteral("No camera is selected."));
  } else if (!path) {
    label_->setText(QStringLiteral("The selected camera has no photograph."));
  } else if (!image_.load(QString::fromStdString(path->string()))) {
    label_->setText(QStringLiteral("Cannot read the photograph “%1”.")
                        .arg(QString::fromStdString(path->string())));
  }
  showScaled();
}

void PhotographWindow::showScaled() {
  if (image_.isNull()) {
    return;  // the label holds the reason instead
  }
  label_->setPixmap(QPixmap::fromImage(
      image_.scaled(label_->size(), Qt::KeepAspectRatio, Qt::SmoothTransformation)));
}

void PhotographWindow::resizeEvent(QResizeEvent* event) {
  QWidget::resizeEvent(event);
  showScaled();
}

}  // namespace cloudreel::app
