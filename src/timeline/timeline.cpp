#include "timeline/timeline.h"

#include <algorithm>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/undo_manager.h"
#include "timeline/edit_point.h"
#include "timeline/timeline_clip.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

namespace {

// The gap between two rows of tracks, in pixels.
constexpr double kTrackGap = 5.0;

// Rows of the given heights from (x, y), width wide, kTrackGap apart.
std::vector<Rect2D> stackRows(const Timeline::TrackList& tracks, double x, double y, double width) {
  std::vector<Rect2D> rows;
  rows.reserve(tracks.size());
  for (const auto& track : tracks) {
    const double height = track->timelineHeight();
    rows.push_back({x, y, width, height});
    y += height + kTrackGap;
  }
  return rows;
}

}  // namespace

Timeline::Timeline() { tracks_.push_back(std::make_shared<TimecodeTrack>()); }

const PropertyTable& Timeline::properties() const {
  using T = Timeline;
  static const PropertyTable table(
      &Object::objectProperties(),
      {property<T>("fps", &T::fps, &T::setFps), property<T>("inPoint", &T::inPoint, &T::setInPoint),
       property<T>("outPoint", &T::outPoint, &T::setOutPoint),
       property<T>("startTimeInSeconds", &T::startTimeInSeconds, &T::setStartTimeInSeconds)});
  return table;
}

int Timeline::indexOfTrack(const TimelineTrack& track) const {
  for (std::size_t i = 0; i < tracks_.size(); ++i) {
    if (tracks_[i].get() == &track) {
      return static_cast<int>(i);
    }
  }
  return -1;
}

void Timeline::addTrack(std::shared_ptr<TimelineTrack> track) {
  if (track) {
    tracks_.push_back(std::move(track));
  }
}

void Timeline::insertTrackAtIndex(std::shared_ptr<TimelineTrack> track, int index) {
  if (!track) {
    return;
  }
  const auto at = std::clamp<std::ptrdiff_t>(index, 0, static_cast<std::ptrdiff_t>(tracks_.size()));
  tracks_.insert(tracks_.begin() + at, std::move(track));
}

void Timeline::removeTrack(const TimelineTrack& track) {
  removeObjectFromTracksAtIndex(indexOfTrack(track));
}

void Timeline::removeObjectFromTracksAtIndex(int index) {
  if (index < 0 || static_cast<std::size_t>(index) >= tracks_.size()) {
    return;
  }
  tracks_.erase(tracks_.begin() + index);
}

void Timeline::applyForTime(float t) {
  if (undoManager_ != nullptr) {
    undoManager_->disableUndoRegistration();
  }
  for (const auto& track : tracks_) {
    track->applyEffectForTime(t);
  }
  if (undoManager_ != nullptr) {
    undoManager_->enableUndoRegistration();
  }
}

float Timeline::totalLengthInSeconds() const {
  float length = 1.0f;
  for (const auto& track : tracks_) {
    length = std::max(length, track->totalLengthInSeconds());
  }
  return length;
}

std::int32_t Timeline::totalLengthInFrames() const {
  return saturatingCast<std::int32_t>(static_cast<float>(fps_) * totalLengthInSeconds());
}

void Timeline::addEditsAtTime(float t) {
  for (const auto& track : tracks_) {
    if (track->isSelectedForEditing()) {
      track->addEditAtTime(t);
    }
  }
}

void Timeline::cutFrom(float a, float b) {
  for (const auto& track : tracks_) {
    if (track->isSelectedForEditing()) {
      track->cutFrom(a, b);
    }
  }
}

void Timeline::liftFrom(float a, float b) {
  for (const auto& track : tracks_) {
    if (track->isSelectedForEditing()) {
      track->liftFrom(a, b);
    }
  }
}

std::vector<std::shared_ptr<EditPoint>> Timeline::editsAtTime(float t) const {
  std::vector<std::shared_ptr<EditPoint>> edits;
  for (const auto& track : tracks_) {
    if (auto point = track->controlPointForTime(t)) {
      edits.push_back(std::make_shared<EditPoint>(point, track));
    }
  }
  return edits;
}

std::shared_ptr<TimelineClip> Timeline::editWithin(float d, float t) const {
  for (const auto& track : tracks_) {
    if (auto point = track->controlPointWithin(d, t)) {
      return point;
    }
  }
  return nullptr;
}

std::shared_ptr<EditPoint> Timeline::editToLeftOfTime(float t) const {
  std::shared_ptr<EditPoint> best;
  float bestTime = 0.0f;
  for (const auto& track : tracks_) {
    const auto point = track->editToLeftOfTime(t);
    if (point && point->begin() > bestTime) {
      bestTime = point->begin();
      best = std::make_shared<EditPoint>(point, track);
    }
  }
  return best;
}

std::shared_ptr<EditPoint> Timeline::editToRightOfTime(float t) const {
  std::shared_ptr<EditPoint> best;
  float bestTime = totalLengthInSeconds();
  for (const auto& track : tracks_) {
    const auto point = track->editToRightOfTime(t);
    if (point && point->begin() < bestTime) {
      bestTime = point->begin();
      best = std::make_shared<EditPoint>(point, track);
    }
  }
  return best;
}

double Timeline::heightOfAllTracks() const {
  double height = 0.0;
  for (const auto& track : tracks_) {
    height += track->timelineHeight() + kTrackGap;
  }
  return height;
}

void Timeline::dumpTimeline() const {
  for (const auto& track : tracks_) {
    track->dumpSequence();
  }
}

std::vector<Rect2D> Timeline::headerRowsInView(const Rect2D& bounds) const {
  return stackRows(tracks_, 5.0, 20.0, bounds.width - 10.0);
}

void Timeline::trackViewWasClicked(const Rect2D& bounds, const Point2D& point) {
  const std::vector<Rect2D> rows = headerRowsInView(bounds);
  for (std::size_t i = 0; i < rows.size(); ++i) {
    if (rows[i].contains(point)) {
      tracks_[i]->wasClicked();
    }
  }
}

std::vector<Rect2D> Timeline::trackRowsInView(const Rect2D& bounds) const {
  return stackRows(tracks_, 0.0, 0.0, bounds.width);
}

std::shared_ptr<TimelineTrack> Timeline::trackForCoordinates(const Point2D& point,
                                                             const Rect2D& bounds) const {
  const std::vector<Rect2D> rows = trackRowsInView(bounds);
  for (std::size_t i = 0; i < rows.size(); ++i) {
    if (rows[i].contains(point)) {
      return tracks_[i];
    }
  }
  return nullptr;
}

Rect2D Timeline::rectForTrack(const TimelineTrack& track, const Rect2D& bounds) const {
  if (indexOfTrack(track) < 0) {
    return {};
  }
  return {bounds.x, bounds.y, bounds.width, track.timelineHeight()};
}

void Timeline::menuRemoveTrack(const TimelineTrack& track) { removeTrack(track); }

bool Timeline::menuInsertFiller(TimelineTrack& track) {
  return track.insertClipInSequenceAt(
      std::make_shared<TimelineClip>(inPoint_, outPoint_ - inPoint_), inPoint_);
}

bool Timeline::menuAddDiscreteClip(const ClipInsertion& insertion) {
  if (!insertion.track() || !insertion.clip()) {
    return false;
  }
  logf("add discrete:%s, %s", insertion.track()->description(), insertion.clip()->description());
  return insertion.track()->insertClipInSequenceAt(insertion.clip(), inPoint_);
}

void Timeline::encodeWithCoder(KeyedArchiver& coder) const {
  coder.encodeList(tracks_, "tracks");
  coder.encodeFloat(startTimeInSeconds_, "startTimeInSeconds");
  coder.encodeInt32(fps_, "fps");
  coder.encodeFloat(inPoint_, "inPoint");
  coder.encodeFloat(outPoint_, "outPoint");
}

void Timeline::initWithCoder(KeyedUnarchiver& coder) {
  tracks_.clear();
  if (auto tracks = coder.decodeListOfClassForKey<TimelineTrack>("tracks")) {
    // Null entries are dropped: every operation walks the tracks.
    for (auto& track : *tracks) {
      if (track) {
        tracks_.push_back(std::move(track));
      }
    }
  }
  startTimeInSeconds_ = coder.decodeFloatForKey("startTimeInSeconds");
  fps_ = coder.decodeInt32ForKey("fps");
  inPoint_ = coder.decodeFloatForKey("inPoint");
  outPoint_ = coder.decodeFloatForKey("outPoint");
}

}  // namespace cloudreel
