#pragma once
// A document's animation: an ordered list of tracks, each animating one
// property of one scene object, with the document's frame rate and the
// marked in and out points. Applying the timeline at a time has every track
// write its value for that time into its object; the views move the time,
// the timeline window edits the tracks through the operations here.
//
// Times are seconds in 32-bit floats; the only conversion to frames the
// timeline makes is totalLengthInFrames.

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "platform/object.h"
#include "platform/plane.h"

namespace cloudreel {

class ClipInsertion;
class EditPoint;
class TimelineClip;
class TimelineTrack;
class UndoManager;

class Timeline : public Object {
 public:
  using TrackList = std::vector<std::shared_ptr<TimelineTrack>>;

  // One ruler track, 25 fps, in and out points not set (-1).
  Timeline();

  std::string_view className() const override { return "Timeline"; }
  const PropertyTable& properties() const override;

  const TrackList& tracks() const { return tracks_; }
  std::int32_t fps() const { return fps_; }
  float inPoint() const { return inPoint_; }
  float outPoint() const { return outPoint_; }
  // Kept in the file; nothing reads it.
  float startTimeInSeconds() const { return startTimeInSeconds_; }
  void setFps(std::int32_t v) { changeValueForKey("fps", fps_, v); }
  void setInPoint(float v) { changeValueForKey("inPoint", inPoint_, v); }
  void setOutPoint(float v) { changeValueForKey("outPoint", outPoint_, v); }
  void setStartTimeInSeconds(float v) {
    changeValueForKey("startTimeInSeconds", startTimeInSeconds_, v);
  }

  // Plain list edits. Removing a track that is not there, or an index
  // outside the list, changes nothing.
  void addTrack(std::shared_ptr<TimelineTrack> track);
  // An index past the end appends; a negative one inserts first.
  void insertTrackAtIndex(std::shared_ptr<TimelineTrack> track, int index);
  void removeTrack(const TimelineTrack& track);
  // The track's place in the list; -1 when it is not there.
  int indexOfTrack(const TimelineTrack& track) const;
  void removeObjectFromTracksAtIndex(int index);

  // Every track, in list order, applies its value for t. Animation is not an
  // edit: undo registration on the owner's undo manager is off meanwhile,
  // so moving the cursor, playing or rendering leaves the undo history as
  // it was, while the values still reach every observer.
  void applyForTime(float t);
  // The undo manager of the document that owns this timeline (not owned;
  // null for none).
  void setUndoManager(UndoManager* manager) { undoManager_ = manager; }
  // The longest track, but never less than one second.
  float totalLengthInSeconds() const;
  // fps × totalLengthInSeconds, truncated toward zero (saturating).
  std::int32_t totalLengthInFrames() const;

  // Forwarded to the tracks selected for editing, in list order.
  void addEditsAtTime(float t);
  void cutFrom(float a, float b);
  void liftFrom(float a, float b);

  // One edit point per track that has a control point at t, in track order.
  std::vector<std::shared_ptr<EditPoint>> editsAtTime(float t) const;
  // The first track's answer to controlPointWithin(d, t).
  std::shared_ptr<TimelineClip> editWithin(float d, float t) const;
  // The nearest control point before t over all tracks. The best starts at
  // 0 and is replaced only on strictly later, so a point at exactly 0 is
  // never answered and on a tie the earlier track wins.
  std::shared_ptr<EditPoint> editToLeftOfTime(float t) const;
  // Likewise after t, starting from the total length, so a point at exactly
  // the end is never answered.
  std::shared_ptr<EditPoint> editToRightOfTime(float t) const;

  // The sum of the track heights with 5-pixel gaps.
  double heightOfAllTracks() const;
  void dumpTimeline() const;

  // --- layout in a view of the given bounds
  // The header rows: from (5, 20), bounds width - 10 wide, each track's
  // height, 5 pixels apart.
  std::vector<Rect2D> headerRowsInView(const Rect2D& bounds) const;
  // Toggles editing of every track whose header row holds the point.
  void trackViewWasClicked(const Rect2D& bounds, const Point2D& point);
  // The track-area rows: from (0, 0), the full bounds width.
  std::vector<Rect2D> trackRowsInView(const Rect2D& bounds) const;
  // The first track whose track-area row holds the point; null for none.
  std::shared_ptr<TimelineTrack> trackForCoordinates(const Point2D& point,
                                                     const Rect2D& bounds) const;
  // At the bounds' origin, the bounds' width and the track's height: the
  // row offset is not added. Empty for a track not in this timeline.
  Rect2D rectForTrack(const TimelineTrack& track, const Rect2D& bounds) const;

  // --- the commands of the track menus, carried out for the window
  // Removes the track.
  void menuRemoveTrack(const TimelineTrack& track);
  // A ripple insert of an empty filler clip over the marked range.
  bool menuInsertFiller(TimelineTrack& track);
  // Inserts the offered clip into its track at the in point.
  bool menuAddDiscreteClip(const ClipInsertion& insertion);

  // "tracks", "startTimeInSeconds", "fps", "inPoint", "outPoint"; reading
  // restores exactly those (no ruler is added to a stored timeline).
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 private:
  TrackList tracks_;
  float startTimeInSeconds_ = 0.0f;
  std::int32_t fps_ = 25;
  float inPoint_ = -1.0f;
  float outPoint_ = -1.0f;
  UndoManager* undoManager_ = nullptr;
};

}  // namespace cloudreel
