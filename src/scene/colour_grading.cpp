#include "scene/colour_grading.h"

#include <algorithm>
#include <cmath>
#include <thread>
#include <utility>

#include "platform/notification_center.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"

namespace cloudreel {

namespace {

// Below this many points one thread grades faster than starting others.
constexpr std::size_t kPointsPerThread = 1u << 18;

// The sessions alive, so that an undo of a grading can end a preview of
// the same layer first (main thread only, as all editing).
std::vector<ColourGradingSession*>& liveSessions() {
  static std::vector<ColourGradingSession*> sessions;
  return sessions;
}

float clampedOr(float v, float lo, float hi, float neutral) {
  return std::isnan(v) ? neutral : std::clamp(v, lo, hi);
}

std::uint8_t toByte(float v) {
  // Clamped first, so the conversion is always in range.
  return static_cast<std::uint8_t>(std::clamp(v, 0.0f, 1.0f) * 255.0f + 0.5f);
}

// Runs work(begin, end) over [0, count) in chunks, one per core for large
// counts.
template <typename Work>
void parallelChunks(std::size_t count, const Work& work) {
  const std::size_t cores = std::max(1u, std::thread::hardware_concurrency());
  const std::size_t threads = std::min(cores, std::max<std::size_t>(1, count / kPointsPerThread));
  if (threads <= 1) {
    work(std::size_t{0}, count);
    return;
  }
  std::vector<std::jthread> workers;
  workers.reserve(threads - 1);
  const std::size_t chunk = (count + threads - 1) / threads;
  for (std::size_t t = 1; t < threads; ++t) {
    const std::size_t begin = std::min(count, t * chunk);
    const std::size_t end = std::min(count, begin + chunk);
    workers.emplace_back([&work, begin, end] { work(begin, end); });
  }
  work(std::size_t{0}, std::min(count, chunk));
}

}  // namespace

// --- the grade

ColourGrade ColourGrade::clamped() const {
  return {clampedOr(brightness, -1.0f, 1.0f, 0.0f), clampedOr(contrast, 0.0f, 4.0f, 1.0f),
          clampedOr(saturation, 0.0f, 4.0f, 1.0f), clampedOr(gamma, 0.1f, 10.0f, 1.0f)};
}

bool ColourGrade::isIdentity() const { return clamped() == ColourGrade{}; }

ColourGrader::ColourGrader(const ColourGrade& requested) {
  const ColourGrade grade = requested.clamped();
  mixes_ = grade.saturation != 1.0f;
  saturation_ = grade.saturation;
  const float inverseGamma = 1.0f / grade.gamma;  // gamma is at least 0.1
  for (int c = 0; c < 256; ++c) {
    const float c1 = static_cast<float>(c) / 255.0f + grade.brightness;
    const float c2 = (c1 - 0.5f) * grade.contrast + 0.5f;
    channel_[c] = std::pow(std::clamp(c2, 0.0f, 1.0f), inverseGamma);
    bytes_[c] = toByte(channel_[c]);
  }
}

std::array<std::uint8_t, 3> ColourGrader::grade(std::uint8_t r, std::uint8_t g,
                                                std::uint8_t b) const {
  if (!mixes_) {
    return {bytes_[r], bytes_[g], bytes_[b]};
  }
  const float rr = channel_[r];
  const float gg = channel_[g];
  const float bb = channel_[b];
  const float luma = 0.2126f * rr + 0.7152f * gg + 0.0722f * bb;
  return {toByte(luma + (rr - luma) * saturation_), toByte(luma + (gg - luma) * saturation_),
          toByte(luma + (bb - luma) * saturation_)};
}

void ColourGrader::gradeRange(const std::uint8_t* originals, std::uint8_t* records,
                              std::size_t stride, std::size_t begin, std::size_t end) const {
  for (std::size_t i = begin; i < end; ++i) {
    const std::uint8_t* in = originals + i * 3;
    std::uint8_t* out = records + i * stride;
    const auto graded = grade(in[0], in[1], in[2]);
    out[0] = graded[0];
    out[1] = graded[1];
    out[2] = graded[2];
  }
}

void ColourGrader::gradeInto(std::span<const std::uint8_t> originals, std::uint8_t* records,
                             std::size_t stride, std::size_t colourOffset,
                             std::size_t count) const {
  count = std::min(count, originals.size() / 3);
  if (records == nullptr || count == 0) {
    return;
  }
  std::uint8_t* colours = records + colourOffset;
  parallelChunks(count, [&](std::size_t begin, std::size_t end) {
    gradeRange(originals.data(), colours, stride, begin, end);
  });
}

// --- the layer's colours

LayerColours LayerColours::of(const PointLayer& layer) {
  LayerColours c;
  c.records = layer.points();
  c.stride = layer.recordSize();
  c.colourOffset = layer.hasNormalsField() ? 24 : 12;
  const std::size_t held = layer.pointArray() ? layer.pointArray()->size() / c.stride : 0;
  c.count = c.records == nullptr || layer.nPoints() <= 0
                ? 0
                : std::min(static_cast<std::size_t>(layer.nPoints()), held);
  return c;
}

std::vector<std::uint8_t> LayerColours::copy() const {
  std::vector<std::uint8_t> colours(count * 3);
  parallelChunks(count, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      const std::uint8_t* in = records + i * stride + colourOffset;
      std::copy(in, in + 3, colours.data() + i * 3);
    }
  });
  return colours;
}

void LayerColours::write(std::span<const std::uint8_t> colours) const {
  const std::size_t n = std::min(count, colours.size() / 3);
  parallelChunks(n, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      std::copy(colours.data() + i * 3, colours.data() + i * 3 + 3,
                records + i * stride + colourOffset);
    }
  });
}

void LayerColours::swap(std::span<std::uint8_t> colours) const {
  const std::size_t n = std::min(count, colours.size() / 3);
  parallelChunks(n, [&](std::size_t begin, std::size_t end) {
    for (std::size_t i = begin; i < end; ++i) {
      std::swap_ranges(colours.data() + i * 3, colours.data() + i * 3 + 3,
                       records + i * stride + colourOffset);
    }
  });
}

// --- the session

ColourGradingSession::ColourGradingSession(std::shared_ptr<PointLayer> layer)
    : layer_(std::move(layer)) {
  if (layer_) {
    const LayerColours colours = LayerColours::of(*layer_);
    array_ = layer_->pointArray();
    count_ = colours.count;
    originals_ = colours.copy();
  }
  liveSessions().push_back(this);
}

ColourGradingSession::~ColourGradingSession() { std::erase(liveSessions(), this); }

bool ColourGradingSession::isValid() const {
  return !finished_ && layer_ && layer_->pointArray() && array_.lock() == layer_->pointArray() &&
         LayerColours::of(*layer_).count == count_;
}

void ColourGradingSession::didChangeColours() const {
  layer_->invalidateOpenGLDisplayLists();
  if (MyDocument* document = layer_->document()) {
    document->hasChanged();
  }
}

void ColourGradingSession::preview(const ColourGrade& grade) {
  if (!isValid()) {
    return;
  }
  const LayerColours colours = LayerColours::of(*layer_);
  ColourGrader(grade).gradeInto(originals_, colours.records, colours.stride, colours.colourOffset,
                                colours.count);
  changed_ = true;
  didChangeColours();
}

void ColourGradingSession::cancel() {
  const bool restore = isValid() && changed_;
  // Finished before the change is reported: the report may reach the
  // controller that owns this session.
  finished_ = true;
  if (restore) {
    LayerColours::of(*layer_).write(originals_);
    didChangeColours();
  }
}

namespace {

// Exchanges the layer's colours with those the step holds and registers
// the same exchange as the step's inverse: undo and redo alternate between
// the two sets of colours with no other copy. A layer whose array was
// replaced since is left alone.
void endPreviewsOf(const PointLayer& layer) {
  // One at a time: ending one reports a change, and its owner may then
  // let other sessions go.
  for (;;) {
    const auto& sessions = liveSessions();
    const auto live = std::find_if(sessions.begin(), sessions.end(), [&](auto* s) {
      return s->layer().get() == &layer && !s->isFinished();
    });
    if (live == sessions.end()) {
      return;
    }
    (*live)->cancel();
  }
}

struct ColourSwap {
  std::weak_ptr<PointLayer> layer;
  std::weak_ptr<PointArray> array;
  std::shared_ptr<std::vector<std::uint8_t>> colours;

  void registerOn(MyDocument& document) const {
    document.undoManager().registerUndoWithTarget(
        &document, [&document, swap = *this] { swap.run(document); });
    document.undoManager().setActionName(kColourGradingActionName);
  }

  void run(MyDocument& document) const {
    const auto target = layer.lock();
    if (!target || !target->pointArray() || array.lock() != target->pointArray()) {
      return;
    }
    endPreviewsOf(*target);
    const LayerColours current = LayerColours::of(*target);
    if (current.count * 3 != colours->size()) {
      return;
    }
    current.swap(*colours);
    registerOn(document);
    target->setIsModified(true);
    target->invalidateOpenGLDisplayLists();
    document.hasChanged();
  }
};

}  // namespace

bool ColourGradingSession::commit(MyDocument& document) {
  if (!isValid()) {
    finished_ = true;
    return false;
  }
  finished_ = true;
  if (!changed_) {
    return true;
  }
  ColourSwap{layer_, array_, std::make_shared<std::vector<std::uint8_t>>(std::move(originals_))}
      .registerOn(document);
  originals_.clear();
  layer_->setIsModified(true);
  didChangeColours();
  document.hasChanged();
  return true;
}

// --- the controller

ColourGradingController::ColourGradingController() {
  NotificationCenter::defaultCenter().addObserver(
      *this, std::string(kLayerActivateNotification), nullptr,
      [this](const Notification&) { followSelection(); });
}

ColourGradingController::~ColourGradingController() {
  NotificationCenter::defaultCenter().removeObserver(*this);
  if (session_) {
    session_->cancel();
  }
}

void ColourGradingController::setView(ColourGradingView* view) {
  view_ = view;
  tellView();
}

std::shared_ptr<PointLayer> ColourGradingController::layer() const {
  const auto doc = document();
  return doc ? std::dynamic_pointer_cast<PointLayer>(doc->selectedLayer()) : nullptr;
}

void ColourGradingController::setGrade(const ColourGrade& grade) {
  grade_ = grade.clamped();
  const auto target = layer();
  if (!target) {
    tellView();
    return;
  }
  if (!session_ || !session_->isValid()) {
    // A layer whose records were replaced since starts from its new colours.
    session_ = std::make_unique<ColourGradingSession>(target);
  }
  session_->preview(grade_);
  tellView();
}

bool ColourGradingController::apply() {
  const auto doc = document();
  if (!isPreviewing() || !doc) {
    return false;
  }
  // Released before the commit reports the change, so the report finds no
  // preview to cancel.
  const std::unique_ptr<ColourGradingSession> session = std::move(session_);
  grade_ = ColourGrade{};
  const bool committed = session->commit(*doc);
  tellView();
  return committed;
}

void ColourGradingController::cancel() {
  const std::unique_ptr<ColourGradingSession> session = std::move(session_);
  grade_ = ColourGrade{};
  if (session) {
    session->cancel();
  }
  tellView();
}

void ColourGradingController::followSelection() {
  // A preview belongs to one layer of one document: when another is shown,
  // the preview is put back.
  if (isPreviewing() && session_->layer() != layer()) {
    cancel();
    return;
  }
  if (session_ && session_->isFinished()) {
    // Ended from outside (an undo of this layer's grading). Kept until the
    // next grade replaces it: this may run inside that session's cancel.
    grade_ = ColourGrade{};
  }
  tellView();
}

void ColourGradingController::tellView() {
  if (view_ != nullptr) {
    view_->reloadGrade();
  }
}

}  // namespace cloudreel
