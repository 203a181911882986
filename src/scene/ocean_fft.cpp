#include "scene/ocean_fft.h"

#include <epoxy/gl.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <string>

#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "scene/my_document.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline_track.h"

namespace cloudreel {

namespace {

// The keys the document observes for undo, with the undo steps' names.
constexpr Layer::UndoableKey kUndoableKeys[] = {{"gridSize", "Change Grid Size"},
                                                {"patchSize", "Change Patch Size"},
                                                {"windSpeed", "Change Wind Speed"},
                                                {"windDirection", "Change Wind Direction"},
                                                {"amplitude", "Change Amplitude"},
                                                {"choppiness", "Change Choppiness"},
                                                {"seed", "Change Seed"},
                                                {"fixedColor", "Change Colour"},
                                                {"drawWireFrame", "Wireframe"}};

// A finite value at zero or above; anything else (negative, NaN, infinite)
// becomes `fallback`.
float nonNegativeFinite(float v, float fallback) {
  return std::isfinite(v) && v >= 0.0f ? v : fallback;
}

float finiteOr(float v, float fallback) { return std::isfinite(v) ? v : fallback; }

std::uint32_t packedColour(const Color& c) {
  const auto byte = [](float v) {
    return static_cast<std::uint32_t>(
        std::lround(std::clamp(finiteOr(v, 0.0f), 0.0f, 1.0f) * 255.0f));
  };
  return byte(c.red()) | byte(c.green()) << 8 | byte(c.blue()) << 16;
}

}  // namespace

OceanFFT::OceanFFT() {
  setName("Ocean");
  setFixedColor(Color::colorWithRGBA(0.12f, 0.32f, 0.48f, 1.0f));
}

OceanFFT::~OceanFFT() = default;

const PropertyTable& OceanFFT::properties() const {
  static const PropertyTable table(
      &PointLayer::properties(),
      {property<OceanFFT>("gridSize", &OceanFFT::gridSize, &OceanFFT::setGridSize),
       property<OceanFFT>("patchSize", &OceanFFT::patchSize, &OceanFFT::setPatchSize),
       property<OceanFFT>("windSpeed", &OceanFFT::windSpeed, &OceanFFT::setWindSpeed),
       property<OceanFFT>("windDirection", &OceanFFT::windDirection, &OceanFFT::setWindDirection),
       property<OceanFFT>("amplitude", &OceanFFT::amplitude, &OceanFFT::setAmplitude),
       property<OceanFFT>("seed", &OceanFFT::seed, &OceanFFT::setSeed),
       property<OceanFFT>("choppiness", &OceanFFT::choppiness, &OceanFFT::setChoppiness),
       property<OceanFFT>("time", &OceanFFT::time, &OceanFFT::setTime),
       property<OceanFFT>("frame", &OceanFFT::frame, &OceanFFT::setFrame)});
  return table;
}

std::shared_ptr<Animatable3DObject> OceanFFT::makeBlank() const {
  return std::make_shared<OceanFFT>();
}

void OceanFFT::copyInto(Animatable3DObject& target) const {
  PointLayer::copyInto(target);
  auto& copy = static_cast<OceanFFT&>(target);
  // The point layer's copy shares the records; an ocean writes its records
  // every frame, so the copy starts without any and computes its own.
  copy.setPointArray(nullptr, 0);
  copy.setTriangles({});
  copy.parameters_ = parameters_;
  copy.choppiness_ = choppiness_;
  copy.time_ = time_;
  copy.setDrawWireFrame(drawWireFrame());
  copy.setFixedColor(fixedColor());
  copy.spectrumIsStale_ = true;
}

// --- parameters

void OceanFFT::setGridSize(std::int32_t v) {
  changeParameter("gridSize", parameters_.gridSize, OceanSpectrum::clampedGridSize(v));
}

void OceanFFT::setPatchSize(float v) {
  changeParameter("patchSize", parameters_.patchSize, nonNegativeFinite(v, 0.0f));
}

void OceanFFT::setWindSpeed(float v) {
  changeParameter("windSpeed", parameters_.windSpeed, nonNegativeFinite(v, 0.0f));
}

void OceanFFT::setWindDirection(float v) {
  changeParameter("windDirection", parameters_.windDirection, finiteOr(v, 0.0f));
}

void OceanFFT::setAmplitude(float v) {
  changeParameter("amplitude", parameters_.amplitude, nonNegativeFinite(v, 0.0f));
}

void OceanFFT::setSeed(std::int32_t v) {
  changeParameter("seed", parameters_.seed, static_cast<std::uint32_t>(v));
}

void OceanFFT::setChoppiness(float v) {
  changeValueForKey("choppiness", choppiness_, finiteOr(v, 0.0f));
}

void OceanFFT::setTime(float v) {
  // The "frame" key is the same value, so its observers hear of it too.
  willChangeValueForKey("frame");
  changeValueForKey("time", time_, finiteOr(v, 0.0f));
  didChangeValueForKey("frame");
}

// --- the surface

void OceanFFT::colourRecords() {
  const std::uint32_t colour = packedColour(*fixedColor());
  for (color_point& p : colorPoints()) {
    p.r = static_cast<std::uint8_t>(colour);
    p.g = static_cast<std::uint8_t>(colour >> 8);
    p.b = static_cast<std::uint8_t>(colour >> 16);
  }
  recordColour_ = colour;
}

void OceanFFT::updateSurface() {
  if (spectrumIsStale_ || !spectrum_) {
    spectrum_ = std::make_unique<OceanSpectrum>(parameters_);
    spectrumIsStale_ = false;
    surfaceIsStale_ = true;
    const int n = spectrum_->gridSize();
    const auto count = static_cast<std::size_t>(n) * static_cast<std::size_t>(n);
    if (static_cast<std::size_t>(std::max(nPoints(), 0)) != count || points() == nullptr) {
      std::shared_ptr<PointArray> array = PointArray::allocate(count * sizeof(color_point));
      if (!array) {
        logWarningf("ocean \"%s\": no memory for a %d × %d surface", name(), n, n);
        setPointArray(nullptr, 0);
        setTriangles({});
        normals_.clear();
        return;
      }
      setPointArray(std::move(array), static_cast<std::int32_t>(count));
      setTriangles(OceanSpectrum::gridTriangles(n));
      normals_.assign(count * 3, 0.0f);
      // The luck byte spreads the vertices over the buckets as an imported
      // cloud's do, should the surface ever be drawn as points.
      std::span<color_point> records = colorPoints();
      for (std::size_t i = 0; i < records.size(); ++i) {
        records[i].luck = static_cast<std::uint8_t>(i);
      }
      colourRecords();
    }
  }
  if (packedColour(*fixedColor()) != recordColour_) {
    colourRecords();
    pointsDidChange();
  }
  if (!surfaceIsStale_ && surfaceTime_ == time_ && surfaceChoppiness_ == choppiness_) {
    return;
  }
  if (!spectrum_->writeSurface(time_, choppiness_, colorPoints(), normals_)) {
    return;
  }
  surfaceTime_ = time_;
  surfaceChoppiness_ = choppiness_;
  surfaceIsStale_ = false;
  pointsDidChange();

  Layer::BoundingBox box{
      std::numeric_limits<double>::max(),    std::numeric_limits<double>::max(),
      std::numeric_limits<double>::max(),    std::numeric_limits<double>::lowest(),
      std::numeric_limits<double>::lowest(), std::numeric_limits<double>::lowest()};
  for (const color_point& p : colorPoints()) {
    box[0] = std::min<double>(box[0], p.x);
    box[1] = std::min<double>(box[1], p.y);
    box[2] = std::min<double>(box[2], p.z);
    box[3] = std::max<double>(box[3], p.x);
    box[4] = std::max<double>(box[4], p.y);
    box[5] = std::max<double>(box[5], p.z);
  }
  if (nPoints() > 0) {
    setBoundingBox(box);
  }
}

void OceanFFT::drawGLWithOptions(const RenderOptions&) {
  updateSurface();
  const std::vector<std::uint32_t>& faces = triangles();
  if (points() == nullptr || faces.empty() || normals_.empty()) {
    return;
  }
  const Color& c = *fixedColor();
  const GLfloat diffuse[4] = {c.red(), c.green(), c.blue(), opacity()};
  const GLfloat ambient[4] = {c.red() * 0.3f, c.green() * 0.3f, c.blue() * 0.3f, opacity()};
  const GLfloat specular[4] = {0.6f, 0.6f, 0.6f, 1.0f};
  // Material, lighting, fog, blending and polygon mode all come back as
  // they were, so the layers drawn after this one see no trace of it.
  glPushAttrib(GL_LIGHTING_BIT | GL_POLYGON_BIT | GL_ENABLE_BIT | GL_COLOR_BUFFER_BIT);
  glEnable(GL_LIGHTING);
  // The layer's transforms may scale it; the normals must stay unit.
  glEnable(GL_NORMALIZE);
  glMaterialfv(GL_FRONT_AND_BACK, GL_AMBIENT, ambient);
  glMaterialfv(GL_FRONT_AND_BACK, GL_DIFFUSE, diffuse);
  glMaterialfv(GL_FRONT_AND_BACK, GL_SPECULAR, specular);
  glMaterialf(GL_FRONT_AND_BACK, GL_SHININESS, 40.0f);
  if (opacity() < 1.0f) {
    glEnable(GL_BLEND);
    glBlendFunc(GL_SRC_ALPHA, GL_ONE_MINUS_SRC_ALPHA);
  }
  if (enableFog()) {
    glEnable(GL_FOG);
  }
  if (drawWireFrame()) {
    glPolygonMode(GL_FRONT_AND_BACK, GL_LINE);
  }
  // Client arrays straight from the records: the surface changes every
  // frame, so a buffer would be filled as often as it is drawn.
  glBindBuffer(GL_ARRAY_BUFFER, 0);
  glEnableClientState(GL_VERTEX_ARRAY);
  glEnableClientState(GL_NORMAL_ARRAY);
  glVertexPointer(3, GL_FLOAT, sizeof(color_point), points());
  glNormalPointer(GL_FLOAT, 0, normals_.data());
  glDrawElements(GL_TRIANGLES, static_cast<GLsizei>(faces.size()), GL_UNSIGNED_INT, faces.data());
  glDisableClientState(GL_NORMAL_ARRAY);
  glDisableClientState(GL_VERTEX_ARRAY);
  glPopAttrib();
}

// --- timeline, undo, archive

void OceanFFT::getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) {
  // Point size, opacity and buckets mean nothing for a surface: the point
  // layer's tracks are not offered.
  Layer::getAnimatablePropsInArray(tracks);
  const ObjectPtr self = weak_from_this().lock();
  tracks.push_back(std::make_shared<TimelineTrack>(self, "frame", "Time"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "windSpeed", "Wind Speed"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "amplitude", "Amplitude"));
  tracks.push_back(std::make_shared<FloatValueTrack>(self, "choppiness", "Choppiness"));
}

void OceanFFT::addObserversForDocument(MyDocument* document) {
  PointLayer::addObserversForDocument(document);
  addUndoObservers(document, kUndoableKeys);
}

void OceanFFT::removeObserversForDocument(MyDocument* document) {
  removeUndoObservers(document, kUndoableKeys);
  PointLayer::removeObserversForDocument(document);
}

void OceanFFT::encodeWithCoder(KeyedArchiver& coder) const {
  PointLayer::encodeWithCoder(coder);
  coder.encodeInt32(parameters_.gridSize, "gridSize");
  coder.encodeFloat(parameters_.patchSize, "patchSize");
  coder.encodeFloat(parameters_.windSpeed, "windSpeed");
  coder.encodeFloat(parameters_.windDirection, "windDirection");
  coder.encodeFloat(parameters_.amplitude, "amplitude");
  coder.encodeFloat(choppiness_, "choppiness");
  coder.encodeInt32(static_cast<std::int32_t>(parameters_.seed), "seed");
  coder.encodeFloat(time_, "time");
  coder.encodeBool(drawWireFrame(), "drawWireFrame");
}

void OceanFFT::initWithCoder(KeyedUnarchiver& coder) {
  PointLayer::initWithCoder(coder);
  const OceanParameters defaults;
  const auto floatOr = [&coder](std::string_view key, float fallback) {
    return coder.containsValueForKey(key) ? coder.decodeFloatForKey(key) : fallback;
  };
  parameters_.gridSize = OceanSpectrum::clampedGridSize(coder.containsValueForKey("gridSize")
                                                            ? coder.decodeInt32ForKey("gridSize")
                                                            : defaults.gridSize);
  parameters_.patchSize = nonNegativeFinite(floatOr("patchSize", defaults.patchSize), 0.0f);
  parameters_.windSpeed = nonNegativeFinite(floatOr("windSpeed", defaults.windSpeed), 0.0f);
  parameters_.windDirection = finiteOr(floatOr("windDirection", defaults.windDirection), 0.0f);
  parameters_.amplitude = nonNegativeFinite(floatOr("amplitude", defaults.amplitude), 0.0f);
  choppiness_ = finiteOr(floatOr("choppiness", 1.0f), 0.0f);
  parameters_.seed = coder.containsValueForKey("seed")
                         ? static_cast<std::uint32_t>(coder.decodeInt32ForKey("seed"))
                         : defaults.seed;
  time_ = finiteOr(floatOr("time", 0.0f), 0.0f);
  setDrawWireFrame(coder.decodeBoolForKey("drawWireFrame"));
  spectrumIsStale_ = true;
}

}  // namespace cloudreel
