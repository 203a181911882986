#pragma once
// Colour grading of a point layer: brightness, contrast, saturation and
// gamma applied to the 8-bit colours of its records.
//
// With c a channel in 0..1 (the byte / 255), each channel is first graded
// on its own:
//   c1 = c + brightness                       (brightness -1..1, 0 neutral)
//   c2 = (c1 - 0.5) × contrast + 0.5          (contrast 0..4, 1 neutral)
//   c3 = pow(clamp(c2, 0, 1), 1 / gamma)      (gamma 0.1..10, 1 neutral)
// which is a 256-entry table per grade. Then the three channels are mixed
// with their Rec. 709 luma Y = 0.2126 r3 + 0.7152 g3 + 0.0722 b3:
//   c4 = Y + (c3 - Y) × saturation            (saturation 0..4, 1 neutral)
// and the byte is round(clamp(c4, 0, 1) × 255). At saturation 1 the whole
// grade is one byte-to-byte table.
//
// A session keeps one copy of the layer's colours (three bytes a point, not
// the records), so every preview grades from the originals and repeated
// previews never accumulate rounding. Cancelling puts the originals back
// without an undo step; committing makes one undo step, "Colour Grading",
// whose undo puts the originals back exactly and whose redo the graded
// colours.

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "scene/document_panel_controller.h"

namespace cloudreel {

class MyDocument;
class PointArray;
class PointLayer;

inline constexpr const char* kColourGradingActionName = "Colour Grading";

struct ColourGrade {
  float brightness = 0.0f;
  float contrast = 1.0f;
  float saturation = 1.0f;
  float gamma = 1.0f;

  // The grade with every value inside its range; a not-a-number becomes
  // the neutral value.
  ColourGrade clamped() const;
  bool isIdentity() const;
  friend bool operator==(const ColourGrade&, const ColourGrade&) = default;
};

// The tables of one grade and the grading of colours with them.
class ColourGrader {
 public:
  explicit ColourGrader(const ColourGrade& grade);

  std::array<std::uint8_t, 3> grade(std::uint8_t r, std::uint8_t g, std::uint8_t b) const;

  // Writes the graded `originals` (three bytes a point) into the colour
  // bytes of `count` records of `stride` bytes whose colour starts at
  // `colourOffset`. Large counts are shared among the processor's cores.
  void gradeInto(std::span<const std::uint8_t> originals, std::uint8_t* records, std::size_t stride,
                 std::size_t colourOffset, std::size_t count) const;

 private:
  void gradeRange(const std::uint8_t* originals, std::uint8_t* records, std::size_t stride,
                  std::size_t begin, std::size_t end) const;

  bool mixes_;  // saturation other than 1
  float saturation_;
  std::array<float, 256> channel_{};       // c3 of each byte
  std::array<std::uint8_t, 256> bytes_{};  // the whole grade when nothing mixes
};

// The colour bytes of a layer's records and their layout.
struct LayerColours {
  std::uint8_t* records = nullptr;
  std::size_t stride = 16;
  std::size_t colourOffset = 12;
  // Records that nPoints names and the array really holds (0 for a
  // negative count).
  std::size_t count = 0;

  static LayerColours of(const PointLayer& layer);
  // Three bytes a point.
  std::vector<std::uint8_t> copy() const;
  void write(std::span<const std::uint8_t> colours) const;
  // Exchanges the records' colours with those in `colours`.
  void swap(std::span<std::uint8_t> colours) const;
};

class ColourGradingSession {
 public:
  // Copies the layer's colours.
  explicit ColourGradingSession(std::shared_ptr<PointLayer> layer);
  ~ColourGradingSession();
  ColourGradingSession(const ColourGradingSession&) = delete;
  ColourGradingSession& operator=(const ColourGradingSession&) = delete;

  const std::shared_ptr<PointLayer>& layer() const { return layer_; }
  // The layer still holds the array and count the copy was made from;
  // otherwise previews, cancel and commit change nothing.
  bool isValid() const;

  // Colours = the grade of the originals; the cached drawing is dropped and
  // the layer's document redraws.
  void preview(const ColourGrade& grade);
  // The originals back, no undo step. The session ends. Undoing or
  // redoing a grading of the same layer ends a preview this way first, so
  // the preview's originals never stand in for colours the history put
  // back.
  void cancel();
  // The current colours stay, as one undo step on the document's undo
  // manager; the layer is marked modified. The session ends. NO when the
  // session was no longer valid (nothing registered).
  bool commit(MyDocument& document);
  bool isFinished() const { return finished_; }

 private:
  void didChangeColours() const;

  std::shared_ptr<PointLayer> layer_;
  std::weak_ptr<PointArray> array_;
  std::size_t count_ = 0;
  std::vector<std::uint8_t> originals_;
  bool changed_ = false;
  bool finished_ = false;
};

// The colour grading panel's logic: grades the front document's selected
// point layer. Moving a slider previews; Apply commits; Cancel (or
// selecting another layer, or another document coming to the front)
// restores the colours.
class ColourGradingView {
 public:
  virtual ~ColourGradingView() = default;
  // The layer or the grade changed: show grade() and whether grading is
  // possible.
  virtual void reloadGrade() = 0;
};

class ColourGradingController : public DocumentPanelController {
 public:
  ColourGradingController();
  ~ColourGradingController() override;

  void setView(ColourGradingView* view);

  // The selected point layer of the followed document; null when none.
  std::shared_ptr<PointLayer> layer() const;
  const ColourGrade& grade() const { return grade_; }
  // Previews the grade on the layer (the grade is clamped first).
  void setGrade(const ColourGrade& grade);
  // Commits the preview as one undo step; NO when nothing was previewed.
  bool apply();
  // Restores the colours and the neutral grade.
  void cancel();
  bool isPreviewing() const { return session_ && !session_->isFinished(); }

 protected:
  void documentDidChange() override { followSelection(); }
  void documentContentsDidChange() override { followSelection(); }

 private:
  void followSelection();
  void tellView();

  ColourGradingView* view_ = nullptr;
  ColourGrade grade_;
  std::unique_ptr<ColourGradingSession> session_;
};

}  // namespace cloudreel
