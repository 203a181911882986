#pragma once
// The CPU point pass of an off-screen frame. Point layers that draw plain
// points hand their records to the pass instead of OpenGL; before anything
// else is drawn through OpenGL, and at the end of the frame, the pass reads
// the framebuffer back, places the waiting points into it with the
// PointRasterizer and writes it back, so the frame is composed in the
// layers' order. A frame of point layers alone is read back once and
// written back once.
//
// The pass takes a layer's points only where the OpenGL state is one the
// rasteriser reproduces exactly (depth test "less" with depth writes, the
// renderer's blending or none, no lighting, fog, smoothing, texturing,
// scissor, stencil, clip planes or shader program, the default depth
// range); otherwise the layer draws through OpenGL as always.

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "platform/error.h"
#include "render/gl/gl_name.h"
#include "render/point_rasterizer.h"

namespace cloudreel {

// Where the points of off-screen frames are placed: "gl" always through
// OpenGL, "cpu" on the CPU, "auto" on the CPU where OpenGL itself runs on
// the CPU (a software rasteriser) and through OpenGL on a GPU.
enum class PointRasterization { Auto, OpenGL, Cpu };

std::optional<PointRasterization> pointRasterizationNamed(std::string_view name);

// True when the current context's OpenGL is a software rasteriser.
bool currentContextIsSoftware();

class CpuPointPass {
 public:
  CpuPointPass() : CpuPointPass(PointRasterizer::Division{}) {}
  explicit CpuPointPass(PointRasterizer::Division division);
  ~CpuPointPass();
  CpuPointPass(const CpuPointPass&) = delete;
  CpuPointPass& operator=(const CpuPointPass&) = delete;

  // Whether the current context can write a frame back (framebuffer blits:
  // OpenGL 3.0 or ARB_framebuffer_object).
  static bool supportedByCurrentContext();

  // Starts a frame on the framebuffer bound for drawing, of the given size
  // and depth precision (32, 24 or 16 bits). Forgets the failure of an
  // earlier frame.
  void beginFrame(int width, int height, int depthBits);

  // Takes a layer's points to draw at the next flush, with the current
  // projection, model-view matrix and viewport (which the batch's own
  // fields are replaced with). False, with nothing taken, when the OpenGL
  // state is one the pass does not reproduce: the caller flushes and draws
  // the points through OpenGL.
  bool submit(PointRasterBatch batch);

  // Draws the points taken since the last flush into the framebuffer.
  // Nothing to do answers true at once. False when the frame could not be
  // read, drawn or written back; the reason is kept for failure().
  bool flush();
  // The same at the end of a frame, keeping the finished frame here instead
  // of writing it back: a caller that only wants its colour takes it from
  // heldColour(), and writeBack() completes the framebuffer when anything
  // must read it there. A new frame drops what is held.
  bool flushKeepingFrame();
  bool holdsFrame() const { return held_; }
  // The held frame's colour, bottom row first (see PointRasterTarget).
  const std::vector<std::uint32_t>& heldColour() const { return colour_; }
  // Writes a held frame back into the framebuffer; true when there was
  // none.
  bool writeBack();

  // The first failure of the frame, if any.
  const std::optional<Error>& failure() const { return failure_; }
  // Points handed to the rasteriser this frame (before the luck test).
  std::size_t pointsThisFrame() const { return pointsThisFrame_; }

 private:
  bool ensureUploadTarget();
  bool fail(std::string message);
  // Reads the framebuffer back (unless this copy is already the frame) and
  // draws the waiting points into the copy.
  bool drawPending();

  PointRasterizer rasterizer_;
  std::vector<PointRasterBatch> pending_;
  std::vector<std::uint32_t> colour_;
  std::vector<std::uint32_t> depth_;
  int width_ = 0;
  int height_ = 0;
  int depthBits_ = 32;
  GLint target_ = 0;
  // The textures the frame is written back from, blitted into the target.
  gl::GLName colourTexture_;
  gl::GLName depthTexture_;
  gl::GLName uploadFramebuffer_;
  int uploadWidth_ = 0;
  int uploadHeight_ = 0;
  int uploadDepthBits_ = 0;
  std::optional<Error> failure_;
  std::size_t pointsThisFrame_ = 0;
  // colour_ and depth_ are the frame, and the framebuffer lacks the last
  // points drawn into them.
  bool held_ = false;
};

}  // namespace cloudreel
