// Card sequence playback at 1080p: how many frames a second the decoder
// delivers when a card plays a numbered sequence in order and each frame is
// waited for (an off-screen render's worst case), what one picture costs
// to decode, and whole frames: a card drawn into 1080p off-screen frames,
// decoding, texture upload and drawing included.

#include <benchmark/benchmark.h>
#include <epoxy/gl.h>
#include <stb/stb_image_write.h>

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "bench_files.h"
#include "render/gl/egl_context.h"
#include "render/gl/framebuffer.h"
#include "render/render_options.h"
#include "scene/animated_card.h"
#include "scene/image_sequence.h"
#include "scene/image_sequence_decoder.h"

namespace {

namespace fs = std::filesystem;
using cloudreel::DecodedImage;
using cloudreel::ImageSequence;
using cloudreel::ImageSequenceDecoder;

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kFrames = 24;

// Gradients, a moving checkerboard and some grain, so the files compress
// like pictures rather than flat colour.
std::vector<std::uint8_t> framePixels(int frame) {
  std::vector<std::uint8_t> pixels(static_cast<std::size_t>(kWidth) * kHeight * 3);
  std::uint32_t grain = 12345u + static_cast<std::uint32_t>(frame);
  std::uint8_t* p = pixels.data();
  for (int y = 0; y < kHeight; ++y) {
    for (int x = 0; x < kWidth; ++x) {
      grain = grain * 1664525u + 1013904223u;
      const int noise = static_cast<int>(grain >> 28);
      const bool square = ((x + frame * 16) / 60 + y / 60) % 2 == 0;
      *p++ = static_cast<std::uint8_t>(x * 255 / kWidth);
      *p++ = static_cast<std::uint8_t>(y * 255 / kHeight / 2 + noise);
      *p++ = static_cast<std::uint8_t>((square ? 180 : 40) + noise);
    }
  }
  return pixels;
}

// The folder of the sequence in one format ("png" or "jpg"), written the
// first time it is asked for; empty when it cannot be written.
fs::path sequenceFolder(const std::string& format) {
  const fs::path folder = cloudreel::bench::benchFolder() / ("cloudreel_card_bench_" + format);
  std::error_code ec;
  fs::create_directories(folder, ec);
  for (int i = 0; i < kFrames; ++i) {
    char name[32];
    std::snprintf(name, sizeof name, "frame_%04d.%s", i, format.c_str());
    const fs::path file = folder / name;
    if (fs::exists(file, ec)) {
      continue;
    }
    const std::vector<std::uint8_t> pixels = framePixels(i);
    const int ok = format == "png"
                       ? stbi_write_png(file.c_str(), kWidth, kHeight, 3, pixels.data(), kWidth * 3)
                       : stbi_write_jpg(file.c_str(), kWidth, kHeight, 3, pixels.data(), 90);
    if (ok == 0) {
      return {};
    }
  }
  return folder;
}

void playSequence(benchmark::State& state, const std::string& format) {
  const fs::path folder = sequenceFolder(format);
  cloudreel::Error error;
  std::optional<ImageSequence> sequence =
      folder.empty() ? std::nullopt
                     : ImageSequence::resolve((folder / ("frame_%04d." + format)).string(), &error);
  if (!sequence) {
    state.SkipWithError(("cannot prepare the sequence: " + error.message).c_str());
    return;
  }
  ImageSequenceDecoder decoder(*sequence, 6);
  int frame = 0;
  for (auto _ : state) {
    const ImageSequenceDecoder::Frame shown = decoder.waitFor(frame);
    if (shown.state != ImageSequenceDecoder::State::Ready) {
      state.SkipWithError(shown.error.c_str());
      return;
    }
    benchmark::DoNotOptimize(shown.image->pixels.data());
    frame = (frame + 1) % kFrames;
  }
  state.counters["frames/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
}

// The card fills a 1080p frame (orthographic, one unit a pixel) and each
// iteration draws the next picture as an off-screen render does: waiting
// for it, uploading it, drawing it, and finishing the frame.
void drawSequence(benchmark::State& state, const std::string& format) {
  const fs::path folder = sequenceFolder(format);
  cloudreel::Error error;
  std::unique_ptr<cloudreel::gl::EglContext> context =
      cloudreel::gl::EglContext::createHeadless(&error);
  std::optional<cloudreel::gl::Framebuffer> framebuffer;
  if (folder.empty() || !context || !context->makeCurrent(&error) ||
      !(framebuffer = cloudreel::gl::Framebuffer::create(kWidth, kHeight, &error))) {
    state.SkipWithError(("cannot prepare: " + error.message).c_str());
    return;
  }
  framebuffer->bind();
  glViewport(0, 0, kWidth, kHeight);
  glMatrixMode(GL_PROJECTION);
  glLoadIdentity();
  glOrtho(-kWidth / 2.0, kWidth / 2.0, -kHeight / 2.0, kHeight / 2.0, -1.0, 1.0);
  glMatrixMode(GL_MODELVIEW);
  glLoadIdentity();
  cloudreel::AnimatedCard card;
  card.setImagePath((folder / ("frame_%04d." + format)).string());
  card.setCardHeight(static_cast<float>(kHeight));
  const cloudreel::RenderOptions offScreen;
  int frame = 0;
  for (auto _ : state) {
    card.setFrame(static_cast<float>(frame));
    glClear(GL_COLOR_BUFFER_BIT | GL_DEPTH_BUFFER_BIT);
    card.drawGLWithOptions(offScreen);
    glFinish();
    frame = (frame + 1) % kFrames;
  }
  state.counters["frames/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()), benchmark::Counter::kIsRate);
  if (card.texturesHeld() > cloudreel::AnimatedCard::kTextureBudget) {
    state.SkipWithError("more textures held than the budget");
  }
}

void BM_CardDrawnInto1080pFramesPng(benchmark::State& state) { drawSequence(state, "png"); }
void BM_CardDrawnInto1080pFramesJpeg(benchmark::State& state) { drawSequence(state, "jpg"); }

void BM_CardSequencePlayback1080pPng(benchmark::State& state) { playSequence(state, "png"); }
void BM_CardSequencePlayback1080pJpeg(benchmark::State& state) { playSequence(state, "jpg"); }

void decodeOne(benchmark::State& state, const std::string& format) {
  const fs::path folder = sequenceFolder(format);
  const fs::path file = folder / ("frame_0000." + format);
  for (auto _ : state) {
    cloudreel::Error error;
    std::optional<DecodedImage> image = cloudreel::decodeImageFile(file, &error);
    if (!image) {
      state.SkipWithError(error.message.c_str());
      return;
    }
    benchmark::DoNotOptimize(image->pixels.data());
  }
  state.SetBytesProcessed(state.iterations() * std::int64_t{kWidth} * kHeight * 4);
}

void BM_DecodeImageFile1080pPng(benchmark::State& state) { decodeOne(state, "png"); }
void BM_DecodeImageFile1080pJpeg(benchmark::State& state) { decodeOne(state, "jpg"); }

}  // namespace

BENCHMARK(BM_CardSequencePlayback1080pPng)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_CardSequencePlayback1080pJpeg)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_CardDrawnInto1080pFramesPng)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_CardDrawnInto1080pFramesJpeg)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_DecodeImageFile1080pPng)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_DecodeImageFile1080pJpeg)->Unit(benchmark::kMillisecond);

BENCHMARK_MAIN();
