#pragma once
// A camera path of one stored pose per frame, read from a text file of
// 4×4 matrices (a frame count, then sixteen numbers a frame, row by row,
// the last column holding the position).

#include <array>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "camera/camera_path.h"
#include "geometry/affine_transform.h"

namespace cloudreel {

// One frame's pose, 184 bytes: archived as raw bytes in the machine's order.
struct CameraPathRecord {
  std::array<double, 3> position{};
  std::array<double, 4> unused{};  // always 0
  AffineTransform::Matrix matrix{};
};
static_assert(sizeof(CameraPathRecord) == 184);

class DiscreteCameraPath : public CameraPath {
 public:
  DiscreteCameraPath() = default;
  explicit DiscreteCameraPath(std::int32_t fps) : CameraPath(fps) {}

  // Reads a matrix path; the path is named after the file's last component.
  // An unreadable file reads as empty text. Null (after printing "Couldn't
  // allocate memory!") when the records cannot be had.
  static std::shared_ptr<DiscreteCameraPath> initWithURL(const std::filesystem::path& url);
  // The same from text in memory; the path stays unnamed.
  static std::shared_ptr<DiscreteCameraPath> initWithText(std::string_view text);

  std::string_view className() const override { return "DiscreteCameraPath"; }

  std::span<const CameraPathRecord> points() const { return records_; }
  // Replaces the records; nFrames becomes their count.
  void setPoints(std::vector<CameraPathRecord> records);
  // 184 bytes a record held.
  std::size_t byteSize() const override { return records_.size() * sizeof(CameraPathRecord); }

  // Null for a frame outside the records (negative, or at or past nFrames);
  // otherwise the record's matrix as orientation and its position times
  // translateGain as position.
  std::shared_ptr<Camera> cameraInObjectSpaceForFrame(std::int32_t frame) const override;
  std::shared_ptr<Camera> cameraInObjectSpaceForTime(float t) const override;

  // After the path keys: "points", the raw records.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  void copyInto(Animatable3DObject& target) const override;

  // Reads a frame count, then `numbersPerRecord` numbers a frame, with C
  // scanning rules (white space skipped, no check that a number was read:
  // what is not read stays 0 for `fill`). An unreadable count leaves
  // nFrames as it was. Answers NO, after printing "Couldn't allocate
  // memory!", when the records cannot be allocated.
  using RecordFiller = void (*)(const std::array<double, 16>& numbers, CameraPathRecord& record);
  bool readRecordsFromText(std::string_view text, std::size_t numbersPerRecord, RecordFiller fill);

 private:
  std::vector<CameraPathRecord> records_;
};

}  // namespace cloudreel
