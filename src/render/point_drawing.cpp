// The drawing half of PointLayer: which points are drawn (the luck test),
// how (points, spheres or a mesh; colours, opacity, size, attenuation,
// lighting) and the cached drawing that later frames replay.

#include "render/point_drawing.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

#include "platform/log.h"
#include "platform/value.h"
#include "render/cpu_point_pass.h"
#include "render/gl/shapes.h"
#include "render/render_options.h"
#include "scene/point_layer.h"

namespace cloudreel {

namespace {

constexpr std::size_t kPlainVertexSize = 16;
constexpr std::size_t kLitVertexSize = 40;

std::size_t luckOffset(bool withNormals) { return withNormals ? 27 : 15; }
std::size_t colourOffset(bool withNormals) { return withNormals ? 24 : 12; }

// The opacity as the alpha byte of a plain point: truncated, and reduced to
// its low eight bits as a byte conversion of the product does (an opacity
// of 2 gives 254). Out-of-range and not-a-number opacities are brought into
// the integer range first, which a direct conversion would leave undefined.
std::uint8_t alphaByte(float opacity) {
  return static_cast<std::uint8_t>(saturatingCast<std::int64_t>(opacity * 255.0f) & 0xff);
}

void writeLitVertex(std::uint8_t* out, const std::uint8_t* record, float opacity) {
  std::memcpy(out, record, 24);  // position and normal
  const float colour[4] = {
      static_cast<float>(record[24] / 255.0),
      static_cast<float>(record[25] / 255.0),
      static_cast<float>(record[26] / 255.0),
      opacity,
  };
  std::memcpy(out + 24, colour, sizeof colour);
}

}  // namespace

// --- LuckOrderedPoints

bool LuckOrderedPoints::holds(const Source& source) const {
  return isUsable() && source_ == source;
}

bool LuckOrderedPoints::isUsable() const {
  // An empty cloud has no buffer and needs none.
  return valid_ && (start_[256] == 0 || buffer_.isUsable());
}

bool LuckOrderedPoints::upload(const Source& source) {
  reset();
  if (source.count == 0 || source.records == nullptr) {
    source_ = source;
    valid_ = true;
    return true;
  }
  const bool lit = source.withNormals;
  const std::size_t recordSize = lit ? 28 : 16;
  const std::size_t vertexSize = lit ? kLitVertexSize : kPlainVertexSize;
  const std::size_t luck = luckOffset(lit);

  // A stable counting sort by luck: count, then place each record after
  // those of smaller luck.
  std::array<std::size_t, 257> start{};
  for (std::size_t i = 0; i < source.count; ++i) {
    ++start[std::size_t{source.records[i * recordSize + luck]} + 1];
  }
  for (std::size_t l = 1; l < start.size(); ++l) {
    start[l] += start[l - 1];
  }
  auto* out = static_cast<std::uint8_t*>(buffer_.allocateAndMap(source.count * vertexSize));
  if (out == nullptr) {
    logWarningf("Cannot upload %zu points for drawing", source.count);
    return false;
  }
  std::array<std::size_t, 256> next{};
  std::copy_n(start.begin(), 256, next.begin());
  if (lit) {
    for (std::size_t i = 0; i < source.count; ++i) {
      const std::uint8_t* record = source.records + i * recordSize;
      writeLitVertex(out + next[record[luck]]++ * vertexSize, record, source.opacity);
    }
  } else {
    const std::uint8_t alpha = alphaByte(source.opacity);
    for (std::size_t i = 0; i < source.count; ++i) {
      const std::uint8_t* record = source.records + i * recordSize;
      std::uint8_t* vertex = out + next[record[15]]++ * vertexSize;
      std::memcpy(vertex, record, 16);
      vertex[15] = alpha;
    }
  }
  if (!buffer_.unmap()) {
    logWarningf("Cannot upload %zu points for drawing", source.count);
    return false;
  }
  start_ = start;
  source_ = source;
  valid_ = true;
  return true;
}

void LuckOrderedPoints::reset() {
  buffer_.reset();
  valid_ = false;
  start_ = {};
}

std::size_t LuckOrderedPoints::countBelow(std::int32_t threshold) const {
  if (threshold <= 0) {
    return 0;
  }
  return start_[static_cast<std::size_t>(std::min(threshold, 256))];
}

void LuckOrderedPoints::draw(std::int32_t threshold, bool withColours) const {
  const std::size_t count = countBelow(threshold);
  if (count == 0 || !buffer_.isUsable()) {
    return;
  }
  const bool lit = source_.withNormals;
  const auto stride = static_cast<GLsizei>(lit ? kLitVertexSize : kPlainVertexSize);
  const gl::VertexBuffer::Binding binding(buffer_);
  glPushClientAttrib(GL_CLIENT_VERTEX_ARRAY_BIT);
  glEnableClientState(GL_VERTEX_ARRAY);
  glVertexPointer(3, GL_FLOAT, stride, nullptr);
  if (lit) {
    glEnableClientState(GL_NORMAL_ARRAY);
    glNormalPointer(GL_FLOAT, stride, reinterpret_cast<const void*>(std::uintptr_t{12}));
  }
  if (withColours) {
    glEnableClientState(GL_COLOR_ARRAY);
    if (lit) {
      glColorPointer(4, GL_FLOAT, stride, reinterpret_cast<const void*>(std::uintptr_t{24}));
    } else {
      glColorPointer(4, GL_UNSIGNED_BYTE, stride,
                     reinterpret_cast<const void*>(std::uintptr_t{12}));
    }
  }
  // count never exceeds nPoints, a 32-bit signed count.
  glDrawArrays(GL_POINTS, 0, static_cast<GLsizei>(count));
  glPopClientAttrib();
}

bool PointDrawingCache::isUsable() const {
  switch (kind) {
    case Kind::None:
      return false;
    case Kind::Points:
      // An empty cloud has no buffer and needs none.
      return points.isUsable();
    case Kind::Spheres:
    case Kind::Mesh:
      return list.isUsable();
  }
  return false;
}

// --- PointLayer

std::int32_t PointLayer::luckThresholdForOptions(const RenderOptions& options) const {
  float limit = bucketLimit_;
  if (options.isYes(kRenderOptionBucketOverride)) {
    limit = numberAs<float>(options.valueForKey(kRenderOptionBucketGlobal)).value_or(0.0f);
  }
  // The product is taken in single precision; the conversion saturates (a
  // huge limit draws everything, not-a-number nothing) where a plain cast
  // would be undefined.
  return saturatingCast<std::int32_t>(static_cast<double>(limit * 255.0f));
}

std::size_t PointLayer::drawableRecordCount() const {
  if (!points_ || nPoints_ <= 0) {
    return 0;
  }
  // Never past the array, whatever nPoints says.
  return std::min(static_cast<std::size_t>(nPoints_), points_->size() / recordSize());
}

PointDrawingCache& PointLayer::drawingCache() {
  if (!drawing_) {
    drawing_ = std::make_unique<PointDrawingCache>();
  }
  return *drawing_;
}

void PointLayer::invalidateOpenGLDisplayLists() {
  Layer::invalidateOpenGLDisplayLists();
  if (drawing_) {
    drawing_->kind = PointDrawingCache::Kind::None;
    drawing_->list.invalidate();
    drawing_->sphere.invalidate();
    drawing_->boundingBox.invalidate();
    drawing_->points.reset();
  }
}

bool PointLayer::hasPointDrawing() const {
  return drawing_ && drawing_->kind != PointDrawingCache::Kind::None;
}

bool PointLayer::hasBoundingBoxDrawing() const {
  return drawing_ && drawing_->boundingBox.name() != 0;
}

void PointLayer::drawGLWithOptions(const RenderOptions& options) {
  PointDrawingCache& cache = drawingCache();
  const std::int32_t threshold = luckThresholdForOptions(options);
  if (threshold != displayListBuckets_) {
    // A new threshold rebuilds the drawing as an invalidation does, except
    // that the uploaded points stay: whether they can be drawn again as
    // they are is decided when the drawing is built.
    LuckOrderedPoints keep = std::move(cache.points);
    invalidateOpenGLDisplayLists();
    cache.points = std::move(keep);
  }
  if (CpuPointPass* pass = options.cpuPointPass(); pass != nullptr) {
    if (drawPointsOnCpu(*pass, threshold)) {
      return;
    }
    // What the pass holds is drawn before these points go through OpenGL.
    pass->flush();
  }
  if (antialias_) {
    glEnable(GL_POINT_SMOOTH);
  }
  const bool fog = enableFog();
  if (fog) {
    glEnable(GL_FOG);
  }
  if (cache.isUsable()) {
    replayDrawing();
  } else {
    buildDrawing(threshold);
  }
  if (antialias_) {
    glDisable(GL_POINT_SMOOTH);
  }
  if (fog) {
    glDisable(GL_FOG);
  }
}

void PointLayer::buildDrawing(std::int32_t threshold) {
  PointDrawingCache& cache = drawingCache();
  listUsesDrawMode_ = drawMode_;
  listUsesColorMode_ = colorMode_;
  displayListBuckets_ = threshold;
  cache.threshold = threshold;
  if (drawMode_ != 0) {
    cache.kind = PointDrawingCache::Kind::Spheres;
    cache.sphere.compile([] { gl::drawSolidSphere(0.015, 11, 11); });
    cache.list.compileAndExecute([this, threshold] { emitSpheres(threshold); });
    return;
  }
  if (nFaces_ != 0 && !drawPointsOnly_) {
    cache.kind = PointDrawingCache::Kind::Mesh;
    cache.list.compileAndExecute([this] { emitMesh(); });
    return;
  }
  recordPointsState(threshold);
  const LuckOrderedPoints::Source source{points_.get(),         pointsGeneration_, points(),
                                         drawableRecordCount(), hasNormals_,       opacity_};
  if (!cache.points.holds(source)) {
    (void)cache.points.upload(source);
  }
  replayDrawing();
}

void PointLayer::recordPointsState(std::int32_t threshold) {
  PointDrawingCache& cache = drawingCache();
  listUsesDrawMode_ = drawMode_;
  listUsesColorMode_ = colorMode_;
  displayListBuckets_ = threshold;
  cache.threshold = threshold;
  cache.kind = PointDrawingCache::Kind::Points;
  cache.pointSize = pointSize_;
  cache.attenuation = attenuatePoints_ ? std::array<float, 3>{atten_a_, atten_b_, atten_c_}
                                       : std::array<float, 3>{1.0f, 0.0f, 0.0f};
  cache.colorMode = colorMode_;
  cache.fixedColor = {fixedColor_->red(), fixedColor_->green(), fixedColor_->blue()};
  cache.withNormals = hasNormals_;
  cache.opacity = opacity_;
}

bool PointLayer::drawPointsOnCpu(CpuPointPass& pass, std::int32_t threshold) {
  PointDrawingCache& cache = drawingCache();
  // The pass draws with the state a points drawing was built with, as a
  // replay through OpenGL would, and records that state when there is no
  // drawing yet (without uploading anything).
  if (cache.kind == PointDrawingCache::Kind::None) {
    if (drawMode_ != 0 || (nFaces_ != 0 && !drawPointsOnly_)) {
      return false;
    }
    recordPointsState(threshold);
  }
  const float size = cache.pointSize;
  if (cache.kind != PointDrawingCache::Kind::Points || cache.withNormals || hasNormals_ ||
      antialias_ || enableFog() || cache.attenuation != std::array<float, 3>{1.0f, 0.0f, 0.0f} ||
      !(size >= 1.0f && size <= 255.0f && size == std::floor(size))) {
    return false;
  }
  PointRasterBatch batch;
  if (cache.colorMode == 1) {
    // A plain colour is opaque whatever the layer's opacity.
    batch.useFixedColour = true;
    batch.fixedColour = std::uint32_t{colourByte(cache.fixedColor[0])} |
                        std::uint32_t{colourByte(cache.fixedColor[1])} << 8 |
                        std::uint32_t{colourByte(cache.fixedColor[2])} << 16 | 0xff000000u;
  } else if (cache.colorMode == 0) {
    if (alphaByte(cache.opacity) != 255) {
      return false;
    }
  } else {
    // Other colour modes draw nothing.
    return true;
  }
  // The records as they are now; a drawing through OpenGL shows a change
  // of them only once it is rebuilt.
  batch.records = points();
  batch.count = drawableRecordCount();
  batch.luckThreshold = cache.threshold;
  batch.pointSize = static_cast<int>(size);
  return pass.submit(batch);
}

void PointLayer::replayDrawing() {
  PointDrawingCache& cache = drawingCache();
  if (cache.kind != PointDrawingCache::Kind::Points) {
    cache.list.call();
    return;
  }
  glPointSize(cache.pointSize);
  glPointParameterfv(GL_POINT_DISTANCE_ATTENUATION, cache.attenuation.data());
  if (cache.withNormals) {
    glEnable(GL_LIGHTING);
    glEnable(GL_NORMALIZE);
    drawPointsWithNormalsWithLuck(cache.threshold);
    glDisable(GL_NORMALIZE);
    glDisable(GL_LIGHTING);
  } else {
    drawPointsWithoutNormalsWithLuck(cache.threshold);
  }
}

void PointLayer::drawPointsWithoutNormalsWithLuck(std::int32_t threshold) {
  const PointDrawingCache& cache = drawingCache();
  if (cache.colorMode == 1) {
    glColor3f(cache.fixedColor[0], cache.fixedColor[1], cache.fixedColor[2]);
    cache.points.draw(threshold, false);
  } else if (cache.colorMode == 0) {
    cache.points.draw(threshold, true);
  }
  // Any other colour mode draws nothing.
}

void PointLayer::drawPointsWithNormalsWithLuck(std::int32_t threshold) {
  const PointDrawingCache& cache = drawingCache();
  if (cache.colorMode == 1) {
    // Lit by the current material; the plain colour is set all the same.
    glColor3f(cache.fixedColor[0], cache.fixedColor[1], cache.fixedColor[2]);
    cache.points.draw(threshold, false);
  } else if (cache.colorMode == 0) {
    // Each point's colour (with the opacity as alpha) is its front diffuse
    // material.
    glColorMaterial(GL_FRONT, GL_DIFFUSE);
    glEnable(GL_COLOR_MATERIAL);
    cache.points.draw(threshold, true);
    glDisable(GL_COLOR_MATERIAL);
  }
}

void PointLayer::emitSpheres(std::int32_t threshold) {
  const std::uint8_t* records = points();
  const std::size_t size = recordSize();
  const std::size_t colour = colourOffset(hasNormals_);
  const std::size_t luck = luckOffset(hasNormals_);
  const std::size_t count = drawableRecordCount();
  for (std::size_t i = 0; i < count; ++i) {
    const std::uint8_t* record = records + i * size;
    if (record[luck] >= threshold) {
      continue;
    }
    float position[3];
    std::memcpy(position, record, sizeof position);
    glPushMatrix();
    glColor3ub(record[colour], record[colour + 1], record[colour + 2]);
    glTranslatef(position[0], position[1], position[2]);
    drawingCache().sphere.call();
    glPopMatrix();
  }
}

void PointLayer::emitMesh() {
  const std::uint8_t* records = points();
  const std::size_t size = recordSize();
  const std::size_t colour = colourOffset(hasNormals_);
  const std::size_t count = drawableRecordCount();
  // The faces that the triangle array really holds.
  const std::size_t faces =
      std::min(static_cast<std::size_t>(std::max(nFaces_, 0)), triangles_.size() / 3);
  glBegin(GL_TRIANGLES);
  // The polygon mode is changed inside the open batch, where GL refuses it
  // (an invalid-operation error), so a wireframe mesh draws filled. Kept as
  // the mesh has always been drawn.
  if (drawWireFrame_) {
    glPolygonMode(GL_FRONT_AND_BACK, GL_LINE);
  }
  for (std::size_t f = 0; f < faces; ++f) {
    const std::uint32_t* face = triangles_.data() + 3 * f;
    // Indices come from files unchecked; a face that names a point the
    // array does not hold is skipped rather than read past the array.
    if (face[0] >= count || face[1] >= count || face[2] >= count) {
      continue;
    }
    for (int k = 0; k < 3; ++k) {
      const std::uint8_t* record = records + std::size_t{face[k]} * size;
      float position[3];
      std::memcpy(position, record, sizeof position);
      glColor3ub(record[colour], record[colour + 1], record[colour + 2]);
      glVertex3d(position[0], position[1], position[2]);
    }
  }
  if (drawWireFrame_) {
    glPolygonMode(GL_FRONT_AND_BACK, GL_FILL);
  }
  glEnd();
}

void PointLayer::drawDecorationsWithOptions(const RenderOptions& options) {
  if (drawBoundingBox_ && options.isYes(kRenderOptionEditor)) {
    drawBoundingBoxGL();
  }
}

void PointLayer::drawBoundingBoxGL() {
  gl::DisplayList& list = drawingCache().boundingBox;
  if (list.isUsable()) {
    list.call();
    return;
  }
  const BoundingBox& b = bbox();
  const float x0 = narrowToFloat(b[0]), y0 = narrowToFloat(b[1]), z0 = narrowToFloat(b[2]);
  const float x1 = narrowToFloat(b[3]), y1 = narrowToFloat(b[4]), z1 = narrowToFloat(b[5]);
  list.compileAndExecute([&] {
    glColor3f(1.0f, 1.0f, 1.0f);
    glBegin(GL_LINES);
    for (const float z : {z0, z1}) {
      for (const float y : {y0, y1}) {
        glVertex3f(x0, y, z);
        glVertex3f(x1, y, z);
      }
      for (const float x : {x0, x1}) {
        glVertex3f(x, y0, z);
        glVertex3f(x, y1, z);
      }
    }
    const float alongZ[4][2] = {{x0, y0}, {x1, y0}, {x0, y1}, {x1, y1}};
    for (const auto& corner : alongZ) {
      glVertex3f(corner[0], corner[1], z0);
      glVertex3f(corner[0], corner[1], z1);
    }
    glEnd();
  });
}

}  // namespace cloudreel
