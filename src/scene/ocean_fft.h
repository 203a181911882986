#pragma once
// A procedural deep-water ocean: a square tile of waves from a wind-driven
// spectrum, evaluated at the layer's time by inverse FFTs and drawn as a lit
// triangle mesh in the layer's colour, optionally as a wireframe. The tile
// lies in the layer's x-z plane, centred on its origin, with heights along
// +y.
//
// The layer is a point layer whose records are the mesh's vertices (in the
// layer's colour) and whose triangles are the grid's, so it counts, copies
// and lists like the other point layers; but the mesh is always computed,
// never stored: the document keeps the parameters and the seed, from which
// the same surface comes back at the same time on every machine.
//
// The timeline drives the time through the "Time" track (key "frame"), and
// the wind speed, amplitude and choppiness through their own tracks.

#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "scene/ocean_spectrum.h"
#include "scene/point_layer.h"

namespace cloudreel {

class OceanFFT : public PointLayer {
 public:
  // "Ocean": a 128 × 128 grid over a 50-unit tile, an 8 m/s wind along +x,
  // amplitude 0.002, choppiness 1, seed 1, time 0, sea blue.
  OceanFFT();
  ~OceanFFT() override;

  std::string_view className() const override { return "OceanFFT"; }
  const PropertyTable& properties() const override;

  // --- what shapes the waves (see OceanParameters for their meaning)
  std::int32_t gridSize() const { return parameters_.gridSize; }
  float patchSize() const { return parameters_.patchSize; }
  float windSpeed() const { return parameters_.windSpeed; }
  float windDirection() const { return parameters_.windDirection; }
  float amplitude() const { return parameters_.amplitude; }
  std::int32_t seed() const { return static_cast<std::int32_t>(parameters_.seed); }
  // How far crests lean towards each other: 0 gives plain height waves.
  float choppiness() const { return choppiness_; }
  // Seconds of the simulation shown now.
  float time() const { return time_; }

  // The grid becomes the power of two nearest to the value within 64-512.
  // The sizes and the wind speed are kept at zero or above and finite,
  // so no value can make the surface not-a-number.
  void setGridSize(std::int32_t v);
  void setPatchSize(float v);
  void setWindSpeed(float v);
  void setWindDirection(float v);
  void setAmplitude(float v);
  void setSeed(std::int32_t v);
  void setChoppiness(float v);
  void setTime(float v);
  // The key the "Time" track drives: the ocean's frame is its time in
  // seconds.
  float frame() const { return time_; }
  void setFrame(float v) { setTime(v); }
  void setFrameForTime(float seconds) override { setTime(seconds); }

  // Brings the mesh up to the parameters and the time; the drawing does
  // this itself. Afterwards the records, the triangles, the normals and
  // the bounding box describe the surface now.
  void updateSurface();
  // Unit normals, three floats a vertex (after updateSurface).
  const std::vector<float>& normals() const { return normals_; }

  // The lit mesh in the fixed colour (its alpha is the layer's opacity), as
  // lines when drawWireFrame is set, fogged when enableFog is.
  void drawGLWithOptions(const RenderOptions& options) override;
  // A mesh, always drawn through OpenGL.
  bool mayDrawIntoPointPass() const override { return false; }

  // The layer's "Transform" track, then "Time", "Wind Speed", "Amplitude"
  // and "Choppiness".
  void getAnimatablePropsInArray(std::vector<std::shared_ptr<TimelineTrack>>& tracks) override;
  // Also makes the document observe the wave parameters, the colour and the
  // wireframe switch for undo.
  void addObserversForDocument(MyDocument* document) override;
  void removeObserversForDocument(MyDocument* document) override;

  // The point layer's keys without records, then "gridSize", "patchSize",
  // "windSpeed", "windDirection", "amplitude", "choppiness", "seed",
  // "time" and "drawWireFrame". Missing keys read as the defaults of a new
  // ocean; values out of range are brought into it as the setters do.
  void encodeWithCoder(KeyedArchiver& coder) const override;
  void initWithCoder(KeyedUnarchiver& coder) override;

 protected:
  bool archivesPointRecords() const override { return false; }
  std::shared_ptr<Animatable3DObject> makeBlank() const override;
  // The point layer's copy, then the parameters; the copy computes a mesh
  // of its own rather than sharing the records.
  void copyInto(Animatable3DObject& target) const override;

 private:
  // Stores a wave parameter, telling its observers; the spectrum is made
  // again at the next update.
  template <typename T>
  void changeParameter(std::string_view key, T& field, T value) {
    changeValueForKey(key, field, value);
    spectrumIsStale_ = true;
  }
  void colourRecords();

  OceanParameters parameters_;
  float choppiness_ = 1.0f;
  float time_ = 0.0f;
  std::unique_ptr<OceanSpectrum> spectrum_;
  bool spectrumIsStale_ = true;
  // The time and choppiness the records show.
  float surfaceTime_ = 0.0f;
  float surfaceChoppiness_ = 0.0f;
  bool surfaceIsStale_ = true;
  std::vector<float> normals_;
  std::uint32_t recordColour_ = 0;
};

}  // namespace cloudreel
