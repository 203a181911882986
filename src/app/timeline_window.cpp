#include "app/timeline_window.h"

#include <QHBoxLayout>
#include <QLabel>
#include <QMenu>
#include <QScrollArea>
#include <QScrollBar>
#include <QShortcut>
#include <QSlider>
#include <QToolButton>
#include <QVBoxLayout>
#include <cmath>

#include "app/application.h"
#include "app/document_window.h"
#include "app/gl_view_widget.h"
#include "app/render_sheets.h"
#include "app/spline_editor_window.h"
#include "app/timeline_view.h"
#include "render/points_document_gl_view.h"
#include "scene/my_document.h"
#include "timeline/timeline.h"
#include "timeline/timeline_editing.h"
#include "timeline/timeline_track.h"

namespace cloudreel::app {

namespace {

// The header rows start this far down (the ruler of the track area is level
// with the first of them).
constexpr int kHeaderTop = 20;

QToolButton* button(const QString& text, const QString& tip, std::function<void()> run,
                    QWidget* parent) {
  auto* b = new QToolButton(parent);
  b->setText(text);
  b->setToolTip(tip);
  b->setAutoRaise(true);
  QObject::connect(b, &QToolButton::clicked, parent, [run = std::move(run)] { run(); });
  return b;
}

}  // namespace

void TimelineWindow::Follower::documentDidChange() {
  const auto document = this->document();
  window_.controller_.setDocument(document.get());
  window_.refresh();
}

void TimelineWindow::Follower::documentContentsDidChange() { window_.refresh(); }

TimelineWindow::TimelineWindow(Application& application)
    : QWidget(nullptr, Qt::Tool), application_(application) {
  setWindowTitle(QStringLiteral("Timeline"));
  resize(900, 260);

  header_ = new TimelineHeaderView(controller_);
  area_ = new TimelineTrackArea(controller_);
  area_->setSplineEditorOpener([this](const std::shared_ptr<Spline>& spline) {
    MyDocument* document = controller_.document();
    SplineEditorWindow::openOnSpline(spline, this, [this, document] {
      // The window may outlive the document it was opened from.
      if (document != nullptr && document == controller_.document()) {
        document->hasChanged();
      }
    });
  });
  connect(area_, &TimelineTrackArea::zoomRequested, this, &TimelineWindow::zoomBy);

  // The headers scroll up and down with the tracks, never sideways.
  auto* headerScroll = new QScrollArea;
  headerScroll->setWidget(header_);
  headerScroll->setWidgetResizable(true);
  headerScroll->setFixedWidth(160);
  headerScroll->setHorizontalScrollBarPolicy(Qt::ScrollBarAlwaysOff);
  headerScroll->setVerticalScrollBarPolicy(Qt::ScrollBarAlwaysOff);
  headerScroll->setFrameShape(QFrame::NoFrame);
  auto* areaHolder = new QWidget;
  auto* holderLayout = new QVBoxLayout(areaHolder);
  holderLayout->setContentsMargins(0, kHeaderTop, 0, 0);
  holderLayout->addWidget(area_);
  areaScroll_ = new QScrollArea;
  areaScroll_->setWidget(areaHolder);
  areaScroll_->setWidgetResizable(true);
  areaScroll_->setFrameShape(QFrame::NoFrame);
  connect(areaScroll_->verticalScrollBar(), &QScrollBar::valueChanged,
          headerScroll->verticalScrollBar(), &QScrollBar::setValue);

  auto* tracks = new QHBoxLayout;
  tracks->setSpacing(0);
  tracks->addWidget(headerScroll);
  tracks->addWidget(areaScroll_, 1);
  auto* layout = new QVBoxLayout(this);
  layout->setContentsMargins(4, 4, 4, 4);
  layout->addWidget(buildTransport());
  layout->addLayout(tracks, 1);

  addShortcuts();
  controller_.setViewDelegate(this);
  controller_.addObserver(*this, "routesPlaybackToDocument", ObservingOptions::New, "");
  follower_ = std::make_unique<Follower>(*this);
  if (DocumentWindow* front = application_.mainWindow()) {
    follower_->setDocument(front->document());
  }
}

TimelineWindow::~TimelineWindow() {
  controller_.removeObserver(*this, "routesPlaybackToDocument");
  controller_.stopPlayback();
  controller_.setViewDelegate(nullptr);
  controller_.setDocument(nullptr);
}

QWidget* TimelineWindow::buildTransport() {
  auto* bar = new QWidget;
  auto* row = new QHBoxLayout(bar);
  row->setContentsMargins(0, 0, 0, 0);
  TimelineWindowController& c = controller_;
  row->addWidget(button(
      QStringLiteral("|◀"), QStringLiteral("To the start (Home)"), [&c] { c.setCursor(0.0f); },
      bar));
  row->addWidget(button(
      QStringLiteral("◀◀"), QStringLiteral("Back 10 frames (Shift+Left)"),
      [&c] { c.previousTenFrames(); }, bar));
  row->addWidget(button(
      QStringLiteral("◀|"), QStringLiteral("Back a frame (Left)"), [&c] { c.previousFrame(); },
      bar));
  row->addWidget(button(
      QStringLiteral("◀"), QStringLiteral("Play backwards (J)"), [&c] { c.playBackwards(); }, bar));
  row->addWidget(button(
      QStringLiteral("■"), QStringLiteral("Stop (K)"), [&c] { c.stopPlayback(); }, bar));
  row->addWidget(button(
      QStringLiteral("▶"), QStringLiteral("Play (L or Space)"), [&c] { c.playForwards(); }, bar));
  row->addWidget(button(
      QStringLiteral("|▶"), QStringLiteral("Forward a frame (Right)"), [&c] { c.nextFrame(); },
      bar));
  row->addWidget(button(
      QStringLiteral("▶▶"), QStringLiteral("Forward 10 frames (Shift+Right)"),
      [&c] { c.nextTenFrames(); }, bar));
  row->addSpacing(12);
  row->addWidget(button(
      QStringLiteral("In"), QStringLiteral("Mark in (I)"), [&c] { c.markIn(); }, bar));
  row->addWidget(button(
      QStringLiteral("Out"), QStringLiteral("Mark out (O)"), [&c] { c.markOut(); }, bar));
  row->addWidget(button(
      QStringLiteral("Cut"),
      QStringLiteral("Take the marked range out of the selected tracks, "
                     "closing the gap (Shift+Delete)"),
      [&c] { c.cut(); }, bar));
  row->addWidget(button(
      QStringLiteral("Lift"),
      QStringLiteral("Take the marked range out of the selected tracks, "
                     "leaving the gap (Delete)"),
      [&c] { c.lift(); }, bar));
  row->addSpacing(12);
  addTrack_ = new QToolButton(bar);
  addTrack_->setText(QStringLiteral("Add Track"));
  addTrack_->setToolTip(
      QStringLiteral("Animate a property of the selected layer or the scene camera"));
  addTrack_->setPopupMode(QToolButton::InstantPopup);
  auto* addMenu = new QMenu(addTrack_);
  connect(addMenu, &QMenu::aboutToShow, this, [this, addMenu] { fillAddTrackMenu(addMenu); });
  addTrack_->setMenu(addMenu);
  row->addWidget(addTrack_);
  row->addWidget(button(
      QStringLiteral("Render…"), QStringLiteral("Render the timeline to files"),
      [this] { runTimelineRender(this, controller_); }, bar));
  row->addStretch();
  cursorLabel_ = new QLabel(QString::fromStdString(controller_.cursorLabel()));
  cursorLabel_->setMinimumWidth(120);
  row->addWidget(cursorLabel_);
  zoom_ = new QSlider(Qt::Horizontal);
  zoom_->setToolTip(QStringLiteral("Zoom the time axis (Ctrl+wheel, + and -)"));
  zoom_->setRange(0, 100);
  zoom_->setFixedWidth(120);
  // Logarithmic: 2 to 2000 pixels a second, 50 in the middle-left.
  const auto ppsForSlider = [](int v) { return 2.0f * std::pow(1000.0f, v / 100.0f); };
  zoom_->setValue(static_cast<int>(std::lround(std::log(25.0) / std::log(1000.0) * 100.0)));
  connect(zoom_, &QSlider::valueChanged, this,
          [this, ppsForSlider](int v) { area_->setPixelsPerSecond(ppsForSlider(v)); });
  row->addWidget(zoom_);
  return bar;
}

void TimelineWindow::addShortcuts() {
  TimelineWindowController& c = controller_;
  const auto bind = [this](const QKeySequence& keys, std::function<void()> run) {
    auto* shortcut = new QShortcut(keys, this);
    connect(shortcut, &QShortcut::activated, this, [run = std::move(run)] { run(); });
  };
  bind(Qt::Key_Space, [&c] { c.isAnimating() ? c.stopPlayback() : c.playForwards(); });
  bind(Qt::Key_L, [&c] { c.playForwards(); });
  bind(Qt::Key_J, [&c] { c.playBackwards(); });
  bind(Qt::Key_K, [&c] { c.stopPlayback(); });
  bind(Qt::Key_Right, [&c] { c.nextFrame(); });
  bind(Qt::Key_Left, [&c] { c.previousFrame(); });
  bind(QKeySequence(Qt::SHIFT | Qt::Key_Right), [&c] { c.nextTenFrames(); });
  bind(QKeySequence(Qt::SHIFT | Qt::Key_Left), [&c] { c.previousTenFrames(); });
  bind(Qt::Key_Home, [&c] { c.setCursor(0.0f); });
  bind(Qt::Key_End, [&c] {
    if (const auto timeline = c.timeline()) {
      c.setCursor(timeline->totalLengthInSeconds());
    }
  });
  bind(Qt::Key_I, [&c] { c.markIn(); });
  bind(Qt::Key_O, [&c] { c.markOut(); });
  bind(QKeySequence(Qt::ALT | Qt::Key_I), [&c] { c.clearIn(); });
  bind(QKeySequence(Qt::ALT | Qt::Key_O), [&c] { c.clearOut(); });
  bind(QKeySequence(Qt::SHIFT | Qt::Key_I), [&c] { c.goToIn(); });
  bind(QKeySequence(Qt::SHIFT | Qt::Key_O), [&c] { c.goToOut(); });
  bind(Qt::Key_Delete, [&c] { c.lift(); });
  bind(Qt::Key_Backspace, [&c] { c.lift(); });
  bind(QKeySequence(Qt::SHIFT | Qt::Key_Delete), [&c] { c.cut(); });
  bind(Qt::Key_Plus, [this] { zoomBy(1); });
  bind(Qt::Key_Equal, [this] { zoomBy(1); });
  bind(Qt::Key_Minus, [this] { zoomBy(-1); });
}

void TimelineWindow::fillAddTrackMenu(QMenu* menu) {
  menu->clear();
  const auto document = follower_->document();
  if (!document) {
    menu->addAction(QStringLiteral("No document"))->setEnabled(false);
    return;
  }
  const std::vector<AddableTrack> offered = addableTracks(*document);
  if (offered.empty()) {
    menu->addAction(QStringLiteral("Nothing more to animate"))->setEnabled(false);
  }
  for (const AddableTrack& addable : offered) {
    const QString title = QStringLiteral("%1 ▸ %2").arg(
        QString::fromStdString(addable.objectName),
        QString::fromStdString(addable.track->title().empty() ? addable.track->managedKey()
                                                              : addable.track->title()));
    QAction* action = menu->addAction(title);
    const std::shared_ptr<TimelineTrack> track = addable.track;
    const std::weak_ptr<MyDocument> weak = document;
    connect(action, &QAction::triggered, this, [this, track, weak] {
      if (const auto target = weak.lock()) {
        addTrackToDocument(*target, track);
        refresh();
      }
    });
  }
}

void TimelineWindow::zoomBy(int steps) { zoom_->setValue(zoom_->value() + steps * 5); }

QString TimelineWindow::cursorLabelText() const { return cursorLabel_->text(); }

void TimelineWindow::setCursorForTime(float t) { area_->setCursorForTime(t); }

void TimelineWindow::setCursorLabel(std::string_view text) {
  cursorLabel_->setText(QString::fromUtf8(text.data(), static_cast<int>(text.size())));
}

void TimelineWindow::setNeedsDisplay() {
  area_->update();
  header_->update();
}

void TimelineWindow::refresh() {
  area_->timelineChanged();
  header_->setMinimumHeight(area_->minimumHeight() + kHeaderTop);
  header_->update();
}

void TimelineWindow::observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object&,
                                                                 const Change&, std::string_view) {
  if (keyPath == "routesPlaybackToDocument") {
    routePlayback(controller_.routesPlaybackToDocument());
  }
}

void TimelineWindow::routePlayback(bool toDocument) {
  // While the timeline plays, only the front window's view redraws.
  MyDocument* document = controller_.document();
  if (document == nullptr) {
    return;
  }
  DocumentWindow* front = application_.mainWindow();
  const bool frontShowsIt = front != nullptr && front->document().get() == document;
  document->setPlaybackView(toDocument && frontShowsIt ? &front->glView().pointView() : nullptr);
}

}  // namespace cloudreel::app
