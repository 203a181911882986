#pragma once
// The colour grading panel: a floating tool window with a slider each for
// brightness, contrast, saturation and gamma over the front document's
// selected point layer. Moving a slider previews the grade on the layer;
// Apply makes it one undo step; Cancel, or closing the panel, puts the
// colours back. The decisions are the core ColourGradingController's.

#include <QWidget>
#include <array>
#include <memory>

#include "scene/colour_grading.h"

class QLabel;
class QPushButton;
class QSlider;

namespace cloudreel::app {

class ColourGradingPanel : public QWidget, public ColourGradingView {
  Q_OBJECT
 public:
  // Grades in the document in front now; then follows the front document.
  explicit ColourGradingPanel(const std::shared_ptr<MyDocument>& document);
  ~ColourGradingPanel() override;

  ColourGradingController& controller() { return controller_; }

 protected:
  void closeEvent(QCloseEvent* event) override;

 private:
  void reloadGrade() override;
  void slidersMoved();

  ColourGradingController controller_;
  QLabel* layerName_ = nullptr;
  // Brightness, contrast, saturation, gamma, in hundredths.
  std::array<QSlider*, 4> sliders_{};
  std::array<QLabel*, 4> values_{};
  QPushButton* apply_ = nullptr;
  QPushButton* cancel_ = nullptr;
  bool showing_ = false;
};

}  // namespace cloudreel::app
