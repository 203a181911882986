#pragma once
// The layer that holds a coloured point cloud: one packed array of point
// records, optionally triangles over them, the settings the points are
// drawn with, and in every record a luck byte by which only a chosen
// fraction of a very large cloud is drawn.
//
// The points either travel inside the document (inline) or live in an
// external point file (".rwb") the layer is linked to, reloaded when the
// document opens and written back when the layer was modified. Copies of a
// layer share one array; it is freed when the last holder goes.

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

#include "platform/color.h"
#include "platform/error.h"
#include "scene/layer.h"

namespace cloudreel {

class CpuPointPass;
class FileInputStream;
struct PointDrawingCache;

// A point: position, colour and the luck byte (0-255) that places it in a
// bucket. The unit of the array, of the archived blob and of the point file.
struct color_point {
  float x, y, z;
  std::uint8_t r, g, b, luck;
};
static_assert(sizeof(color_point) == 16);

// The record of a layer read from a point file with normals.
struct color_point_with_normal {
  float x, y, z;
  float nx, ny, nz;
  std::uint8_t r, g, b, luck;
};
static_assert(sizeof(color_point_with_normal) == 28);

// The errors of the point file: this domain and code, the message saying
// what failed.
inline constexpr std::string_view kPointFileErrorDomain = "myDomain";
inline constexpr int kPointFileErrorCode = 100;
// The application's own domain, which the importers' errors use (with the
// point file's code), so they are told from the point file's.
inline constexpr std::string_view kApplicationErrorDomain = "Cloudreel";

// Zeroed record storage shared between a layer and its copies.
class PointArray {
 public:
  // Null when the memory cannot be had.
  static std::shared_ptr<PointArray> allocate(std::size_t bytes);
  ~PointArray();
  PointArray(const PointArray&) = delete;
  PointArray& operator=(const PointArray&) = delete;

  std::uint8_t* data() const { return data_; }
  std::size_t size() const { return size_; }

 private:
  PointArray(std::uint8_t* data, std::size_t size) : data_(data), size_(size) {}
  std::uint8_t* data_;
  std::size_t size_;
};

class PointLayer : public Layer {
 public:
  // No points; point size and fixed colour from the user defaults
  // ("KTPointSize", "KTPointColor").
  PointLayer();
  ~PointLayer() override;

  // A layer of the points in the point file at `url`, linked to it when
  // `shouldLink`; named after the file. A load error is presented to the
  // user and gives no layer.
  static std::shared_ptr<PointLayer> initWithURLShouldLink(const std::filesystem::path& url,
                                                           bool shouldLink);

  std::string_view className() const override { return "PointLayer"; }
  const PropertyTable& properties() const override;

  // --- the records
  std::int32_t nPoints() const { return nPoints_; }
  std::int32_t nFaces() const { return nFaces_; }
  // The record layout: 28-byte records with normals when set.
  bool hasNormalsField() const { return hasNormals_; }
  std::size_t recordSize() const { return hasNormals_ ? 28 : 16; }
  // The array's bytes (null when there is none) and the array itself.
  std::uint8_t* points() const { return points_ ? points_->data() : nullptr; }
  const std::shared_ptr<PointArray>& pointArray() const { return points_; }
  // The 16-byte records; empty for a layer of 28-byte records.
  std::span<color_point> colorPoints() const;
  const std::vector<std::uint32_t>& triangles() const { return triangles_; }
  void setNPoints(std::int32_t v) { changeValueForKey("nPoints", nPoints_, v); }
  void setTriangles(std::vector<std::uint32_t> triangles);

  // Replaces the array by `count` zeroed records of the layout hasNormals
  // selects and answers it. When the memory cannot be had it prints
  // "Couldn't allocate memory!" and answers null, with no array. A negative
  // count is refused the same way.
  std::uint8_t* allocatePointArrayWithSize(std::int32_t count);

  // Draws each point's luck from the process-wide generator: luck =
  // trunc(powf(u, e) × 255) for u uniform in [0, 1). Exponent 1 spreads
  // luck evenly over 0-254, above 1 crowds it towards 0, and 0 sets every
  // luck to 255 (such points are never drawn). The stride is 16 bytes even
  // for 28-byte records, as the buckets of such layers have always been
  // drawn; only the records that stride reaches inside the array change.
  void reRandomizeWithExponent(float e);

  // --- the point file
  const std::filesystem::path& originalURL() const { return originalURL_; }
  bool fileStoredAsLink() const { return fileStoredAsLink_; }
  bool pointFileCanBeLinked() const { return !originalURL_.empty(); }
  void setOriginalURL(std::filesystem::path v);
  void setFileStoredAsLink(bool v) { changeValueForKey("fileStoredAsLink", fileStoredAsLink_, v); }

  // Both answer YES when they FAILED and NO when they succeeded: the
  // reverse of the usual convention. Decide by the error, never by the
  // result: a load that reads fewer records than the file's count answers
  // NO and yet stores "Cannot read points: short read".
  virtual bool savePointsToURLError(const std::filesystem::path& url, Error* error) const;
  // Virtual so that a linked layer of another file kind (a bundle file)
  // reloads through its own reader when the document is opened.
  virtual bool loadPointsFromURLError(const std::filesystem::path& url, Error* error);
  // The file to read for `url`: the file itself, else the file of the same
  // name in the point cache folder ("KTPointCachePath"), else one the user
  // locates; null when the user cancels.
  static std::unique_ptr<FileInputStream> fileHandleForURL(const std::filesystem::path& url);

  // Writes a linked layer back to its file (errors are presented to the
  // user; success clears isModified). An inline layer gets the alert
  // "Cannot save".
  virtual void saveLinkedLayer();

  // --- drawing settings
  std::int32_t drawMode() const { return drawMode_; }
  bool drawPointsOnly() const { return drawPointsOnly_; }
  float pointSize() const { return pointSize_; }
  float bucketLimit() const { return bucketLimit_; }
  std::int32_t colorMode() const { return colorMode_; }
  const std::shared_ptr<Color>& fixedColor() const { return fixedColor_; }
  bool antialias() const { return antialias_; }
  float opacity() const { return opacity_; }
  bool drawBoundingBox() const { return drawBoundingBox_; }
  bool drawWireFrame() const { return drawWireFrame_; }
  bool attenuatePoints() const { return attenuatePoints_; }
  float atten_a() const { return atten_a_; }
  float atten_b() const { return atten_b_; }
  float atten_c() const { return atten_c_; }

  // Changing the draw or colour mode from the one the cached drawing was
  // built with invalidates it; a point size change always does.
  void setDrawMode(std::int32_t v);
  void setColorMode(std::int32_t v);
  void setPointSize(float v);
  void setDrawPointsOnly(bool v) { changeValueForKey("drawPointsOnly", drawPointsOnly_, v); }
  void setBucketLimit(float v) { changeValueForKey("bucketLimit", bucketLimit_, v); }
  // A null colour is stored as opaque black.
  void setFixedColor(std::shared_ptr<Color> v);
  void setAntialias(bool v) { changeValueForKey("antialias", antialias_, v); }
  void setOpacity(float v) { changeValueForKey("opacity", opacity_, v); }
  void setDrawBoundingBox(bool v) { changeValueForKey("drawBoundingBox", drawBoundingBox_, v); }
  void setDrawWireFrame(bool v) { changeValueForKey("drawWireFrame", drawWireFrame_, v); }
  void setAttenuatePoints(bool v) { changeValueForKey("attenuatePoints", attenuatePoints_, v); }
  void setAtten_a(float v) { changeValueForKey("atten_a", atten_a_, v); }
  void setAtten_b(float v) { changeValueForKey("atten_b", atten_b_, v); }
  void setAtten_c(float v) { changeValueForKey("atten_c", atten_c_, v); }

  // --- drawing
  // The points whose luck byte is below the threshold are drawn: threshold
  // = trunc(limit × 255) in single precision, the limit being the layer's
  // bucketLimit, or the options' global limit when they say to override
  // (kRenderOptionBucketOverride YES). Limit 1 draws luck 0-254; only a
  // limit of 1.004 or more draws luck 255 too.
  std::int32_t luckThresholdForOptions(const RenderOptions& options) const;
  // Points (or the mesh, or spheres) from the cached drawing, built first
  // when a trigger asked for it: a threshold other than the one it was
  // built with, a draw or colour mode change, any point size change, or
  // invalidateOpenGLDisplayLists. Opacity, attenuation, fixed colour,
  // wireframe and points-only changes show only after a rebuild.
  void drawGLWithOptions(const RenderOptions& options) override;
  bool mayDrawIntoPointPass() const override { return true; }
  // The bounding box, in editor frames only, whether or not the layer is
  // visible.
  void drawDecorationsWithOptions(const RenderOptions& options) override;
  // The box as twelve white lines, from a cached list.
  void drawBoundingBoxGL();
  // The point batch of each record layout at a threshold, with the state
  // the cached drawing was built with.
  void drawPointsWithNormalsWithLuck(std::int32_t threshold);
  void drawPointsWithoutNormalsWithLuck(std::int32_t threshold);
  // Drops the cached drawing of the points and of the box.
  void invalidateOpenGLDisplayLists() override;
  bool hasPointDrawing() const;
  bool hasBoundingBoxDrawing() const;

  // The threshold, draw mode and colour mode the cached drawing was built
  // with.
  std::int32_t displayListBuckets() const { return displayListBuckets_; }
  std::int32_t listUsesDrawMode() const { return listUsesDrawMode_; }
  std::int32_t listUsesColorMode() const { return listUsesColorMode_; }

  // --- queries
  bool isPointLayer() const override { return true; }
  virtual bool hasTrueColor() const { return true; }
  // The query, unlike the record-layout field, answers NO for every point
  // layer.
  virtual bool hasNormals() const { return false; }
  // nPoints × 16 whatever the record size.
  std::size_t byteSize() const override;

  // Also makes the document observe "pointSize" ("Change Point Size").
  // The layer's "Transform" track, then "Point Size", "Opacity" and
  // "Bucket Limit".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  void addObserversForDocument(MyDocument* document) override;
  void removeObserversForDocument(MyDocument* document) override;

  // After the layer keys: "points" (inline layers only: nPoints × 16
  // bytes), "drawMode", "nPoints", "antialias", "drawPointsOnly",
  // "hasNormals", "pointSize", "bucketLimit", "originalURL" (an absolute
  // path, or null), "fileStoredAsLink", "fixedColor" (a nested colour
  // archive), "attenuatePoints", "atten_a", "atten_b", "atten_c". Opacity,
  // colour mode, box, wireframe and triangles are not saved.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The layer copy, then the settings and the same array; colour mode,
  // opacity, drawPointsOnly, the normals layout, the faces and the cached
  // drawing are not copied: the copy draws as a plain coloured cloud.
  void copyInto(Animatable3DObject& target) const override;

  // Links the layer to `url` (or not), names it after the file and loads
  // it through the layer's own reader; a load error is presented to the
  // user and answers false.
  bool loadFromURL(const std::filesystem::path& url, bool shouldLink);
  // Whether the archive carries the records: for an inline layer, unless
  // the layer computes its records from what it archives instead.
  virtual bool archivesPointRecords() const { return !fileStoredAsLink_; }
  void setPointArray(std::shared_ptr<PointArray> array, std::int32_t count);
  // Call after changing records in place, so that a drawing built later
  // does not reuse points uploaded before.
  void pointsDidChange() { ++pointsGeneration_; }

 private:
  PointDrawingCache& drawingCache();
  // Records that nPoints names and the array really holds.
  std::size_t drawableRecordCount() const;
  void buildDrawing(std::int32_t threshold);
  void replayDrawing();
  // The state a points drawing is built with, taken from the layer.
  void recordPointsState(std::int32_t threshold);
  // Hands the points to an off-screen frame's CPU pass when they are plain
  // points the pass draws exactly (see CpuPointPass); false when they must
  // go through OpenGL.
  bool drawPointsOnCpu(CpuPointPass& pass, std::int32_t threshold);
  void emitSpheres(std::int32_t threshold);
  void emitMesh();

  std::shared_ptr<PointArray> points_;
  std::int32_t nPoints_ = 0;
  std::int32_t nFaces_ = 0;
  bool hasNormals_ = false;
  std::filesystem::path originalURL_;
  bool fileStoredAsLink_ = false;
  std::vector<std::uint32_t> triangles_;
  std::int32_t drawMode_ = 0;
  bool drawPointsOnly_ = false;
  float pointSize_ = 1.0f;
  float bucketLimit_ = 1.0f;
  std::int32_t displayListBuckets_ = 0;
  std::int32_t colorMode_ = 0;
  std::shared_ptr<Color> fixedColor_;
  bool antialias_ = false;
  float opacity_ = 1.0f;
  bool drawBoundingBox_ = false;
  bool drawWireFrame_ = false;
  bool attenuatePoints_ = false;
  float atten_a_ = 0.0f;
  float atten_b_ = 0.0f;
  float atten_c_ = 1.0f;
  std::int32_t listUsesDrawMode_ = 0;
  std::int32_t listUsesColorMode_ = 0;
  std::unique_ptr<PointDrawingCache> drawing_;
  std::uint64_t pointsGeneration_ = 0;
};

}  // namespace cloudreel
