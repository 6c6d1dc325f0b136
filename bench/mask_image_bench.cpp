// SPDX-License-Identifier: MIT
// A mask image drawn onto a tracked face and blended into a camera image of 1280 x 720, beside
// OpenCV on one thread. Each bench compares its result with the engine's: the counter `off` is the
// share of pixels that differ by more than kAllowedLevels in some channel, of those drawn on.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <opencv2/core.hpp>
#include <vector>

#include "core/model_tables.h"
#include "core/tracking_context.h"
#include "opencv_mask.h"
#include "tracked_faces.h"

namespace n3ds::bench {
namespace {

// OpenCV rounds where the engine truncates, and blends texture pixels in steps of 1/32.
constexpr int kAllowedLevels = 3;
// Along the outline both draw pixels that the other one does not, by their rules for edges.
constexpr double kAllowedOutline = 0.03;
constexpr double kAllowedBlend = 0.0;

constexpr int kTextureSize = 512;

NSVL_OFFSCREEN Describe(cv::Mat& image, uint32_t format) {
  NSVL_OFFSCREEN described = {};
  described.pixelFormat = format;
  described.width = image.cols;
  described.height = image.rows;
  described.plane[0] = image.data;
  described.pitch[0] = static_cast<int32_t>(image.step);
  return described;
}

uint8_t Wave(double x, double y, double period) {
  return static_cast<uint8_t>(128 + 100 * std::sin(x / period) * std::cos(y / period));
}

// Smooth in all channels, so that pixels a fraction apart are alike; half transparent in places.
cv::Mat MakeTexture() {
  cv::Mat texture(kTextureSize, kTextureSize, CV_8UC4);
  for (int y = 0; y < texture.rows; ++y) {
    for (int x = 0; x < texture.cols; ++x) {
      texture.at<cv::Vec4b>(y, x) = {Wave(x, y, 150), Wave(y, x, 110), Wave(x + y, x, 130),
                                     static_cast<uint8_t>(155 + Wave(x, y, 170) / 3)};
    }
  }
  return texture;
}

// A tracked face in a camera image, the mask's texture, and the mask drawn by the engine.
struct Scene {
  TrackedFaces faces{1};
  cv::Mat texture = MakeTexture();
  N3DS_2D_TEXTURE_MASK mask = {nullptr, 0, nullptr, 0, Describe(texture, N3DS_FORMAT_BGRA32)};
  std::vector<TrianglePair> triangles;
  CoordinateMap map;
  cv::Mat drawn = cv::Mat(kTrackHeight, kTrackWidth, CV_8UC4);
  cv::Rect where;  // of the face, on even pixels
  cv::Mat bgr = cv::Mat(kTrackHeight, kTrackWidth, CV_8UC3);
  cv::Mat luma = cv::Mat(kTrackHeight, kTrackWidth, CV_8UC1);
  cv::Mat chroma = cv::Mat(kTrackHeight / 2, kTrackWidth / 2, CV_8UC2);

  Scene() {
    cv::setNumThreads(1);
    MakeTriangles();
    map = RenderMap(triangles);
    NSVL_OFFSCREEN output = Describe(drawn, N3DS_FORMAT_BGRA32);
    Warp(&output);
    // A pixel to spare for the outline, then to even numbers.
    const cv::Rect& r = map.where;
    const cv::Point from((r.x - 2) & ~1, (r.y - 2) & ~1);
    const cv::Point to((r.br().x + 3) & ~1, (r.br().y + 3) & ~1);
    where = cv::Rect(from, to) & cv::Rect(cv::Point(), drawn.size());
    for (int y = 0; y < bgr.rows; ++y) {
      for (int x = 0; x < bgr.cols; ++x) {
        bgr.at<cv::Vec3b>(y, x) = {Wave(x, y, 20), Wave(y, x, 30), Wave(x, y, 45)};
        luma.at<uint8_t>(y, x) = Wave(x, y, 25);
        chroma.at<cv::Vec2b>(y / 2, x / 2) = {static_cast<uint8_t>(96 + Wave(x, y, 60) / 4),
                                              static_cast<uint8_t>(96 + Wave(y, x, 80) / 4)};
      }
    }
  }
  MRESULT Warp(NSVL_OFFSCREEN* output) {
    return N3DS_WarpFaceMask(faces.core(), &mask, output, &faces.model(0), kTrackWidth,
                             kTrackHeight, 0);
  }

 private:
  cv::Point2f Project(uint16_t vertex) const {
    const TrackingContext& context = *ContextOf(faces.core());
    const float* p = context.maskPose[0];
    const float* K = context.camera;
    const float* v = faces.model(0).vertices + 3 * vertex;
    double camera[3];
    for (int i = 0; i < 3; ++i) {
      camera[i] = double{p[4 * i]} * v[0] + double{p[4 * i + 1]} * v[1] +
                  double{p[4 * i + 2]} * v[2] + p[4 * i + 3];
    }
    return {static_cast<float>(K[0] * camera[0] / camera[2] + K[2]),
            static_cast<float>(K[4] * camera[1] / camera[2] + K[5])};
  }
  void MakeTriangles() {
    for (const auto& corners : kTriangles) {
      TrianglePair t;
      for (int c = 0; c < 3; ++c) {
        const float* uv = kTextureCoordinates[corners[c]];
        t.image[c] = Project(corners[c]);
        t.texture[c] = {std::min(uv[0] * kTextureSize, kTextureSize - 3.0f),
                        std::min(uv[1] * kTextureSize, kTextureSize - 3.0f)};
      }
      triangles.push_back(t);
    }
  }
};

Scene& SharedScene() {
  static Scene scene;
  return scene;
}

int LargestDifference(const uint8_t* a, const uint8_t* b, int channels) {
  int largest = 0;
  for (int c = 0; c < channels; ++c) largest = std::max(largest, std::abs(a[c] - b[c]));
  return largest;
}

// Compares two images where `drawn` or the first is not transparent, or everywhere in `where`.
void ExpectAlike(const cv::Mat& engine, const cv::Mat& peer, const cv::Rect& where, double allowed,
                 benchmark::State& state) {
  int compared = 0, off = 0;
  const int channels = engine.channels();
  for (int y = where.y; y < where.br().y; ++y) {
    for (int x = where.x; x < where.br().x; ++x) {
      const uint8_t* a = engine.ptr(y, x);
      const uint8_t* b = peer.ptr(y, x);
      if (channels == 4 && a[3] == 0 && b[3] == 0) continue;
      compared++;
      if (LargestDifference(a, b, channels) > kAllowedLevels) off++;
    }
  }
  const double share = static_cast<double>(off) / compared;
  state.counters["pixels"] = compared;
  state.counters["off"] = std::max(share, state.counters["off"].value);
  if (compared < 1000 || !(share <= allowed)) state.SkipWithError("the images differ");
}

void WarpEngine(benchmark::State& state) {
  Scene& s = SharedScene();
  cv::Mat image(s.drawn.size(), CV_8UC4);
  NSVL_OFFSCREEN output = Describe(image, N3DS_FORMAT_BGRA32);
  for (auto _ : state) {
    if (s.Warp(&output) != N3DS_OK) state.SkipWithError("no warp");
  }
  ExpectAlike(s.drawn, image, cv::Rect(cv::Point(), image.size()), 0, state);
}

template <typename Warp>
void WarpPeer(benchmark::State& state, Warp warp) {
  const Scene& s = SharedScene();
  cv::Mat image(s.drawn.size(), CV_8UC4);
  for (auto _ : state) warp(s, &image);
  ExpectAlike(s.drawn, image, cv::Rect(cv::Point(), image.size()), kAllowedOutline, state);
}
void WarpOpencvPiecewise(benchmark::State& state) {
  WarpPeer(state, [](const Scene& s, cv::Mat* p) { WarpPiecewise(s.texture, s.triangles, p); });
}
void WarpOpencvRemap(benchmark::State& state) {
  WarpPeer(state, [](const Scene& s, cv::Mat* p) { WarpByMap(s.texture, s.map, p); });
}

cv::Mat BlendBgr24ByEngine(Scene& s, cv::Mat* output) {
  NSVL_OFFSCREEN image = Describe(s.bgr, N3DS_FORMAT_BGR24);
  NSVL_OFFSCREEN mask = Describe(s.drawn, N3DS_FORMAT_BGRA32);
  NSVL_OFFSCREEN out = Describe(*output, N3DS_FORMAT_BGR24);
  N3DS_BlendFaceMask(nullptr, &image, &mask, &out);
  return *output;
}

void BlendBgr24Engine(benchmark::State& state) {
  Scene& s = SharedScene();
  cv::Mat image(s.bgr.size(), CV_8UC3), peer(s.bgr.size(), CV_8UC3);
  for (auto _ : state) BlendBgr24ByEngine(s, &image);
  BlendBgr24(s.bgr, s.drawn, s.where, &peer);
  ExpectAlike(image, peer, cv::Rect(cv::Point(), peer.size()), kAllowedBlend, state);
}

void BlendBgr24Opencv(benchmark::State& state) {
  Scene& s = SharedScene();
  cv::Mat image(s.bgr.size(), CV_8UC3), peer(s.bgr.size(), CV_8UC3);
  for (auto _ : state) BlendBgr24(s.bgr, s.drawn, s.where, &peer);
  BlendBgr24ByEngine(s, &image);
  ExpectAlike(image, peer, cv::Rect(cv::Point(), peer.size()), kAllowedBlend, state);
}

struct Nv21Image {
  cv::Mat luma, chroma;
};

void BlendNv21ByEngine(Scene& s, Nv21Image* output) {
  NSVL_OFFSCREEN image = Describe(s.luma, N3DS_FORMAT_NV21);
  image.plane[1] = s.chroma.data;
  image.pitch[1] = static_cast<int32_t>(s.chroma.step);
  NSVL_OFFSCREEN mask = Describe(s.drawn, N3DS_FORMAT_BGRA32);
  NSVL_OFFSCREEN out = Describe(output->luma, N3DS_FORMAT_NV21);
  out.plane[1] = output->chroma.data;
  out.pitch[1] = static_cast<int32_t>(output->chroma.step);
  N3DS_BlendFaceMask(nullptr, &image, &mask, &out);
}
void BlendNv21ByOpencv(const Scene& s, Nv21Image* output) {
  BlendNv21(s.luma, s.chroma, s.drawn, s.where, &output->luma, &output->chroma);
}

// Neither writes outside of the mask; both outputs start as the image.
template <typename Blend>
void RunNv21(benchmark::State& state, Blend blend) {
  Scene& s = SharedScene();
  Nv21Image engine{s.luma.clone(), s.chroma.clone()}, peer{s.luma.clone(), s.chroma.clone()};
  for (auto _ : state) blend(s, &engine, &peer);
  BlendNv21ByEngine(s, &engine);
  BlendNv21ByOpencv(s, &peer);
  ExpectAlike(engine.luma, peer.luma, s.where, kAllowedBlend, state);
  const cv::Rect half(s.where.x / 2, s.where.y / 2, s.where.width / 2, s.where.height / 2);
  ExpectAlike(engine.chroma, peer.chroma, half, kAllowedBlend, state);
}
void BlendNv21Engine(benchmark::State& state) {
  RunNv21(state, [](Scene& s, Nv21Image* e, Nv21Image*) { BlendNv21ByEngine(s, e); });
}
void BlendNv21Opencv(benchmark::State& state) {
  RunNv21(state, [](Scene& s, Nv21Image*, Nv21Image* p) { BlendNv21ByOpencv(s, p); });
}

BENCHMARK(WarpEngine)->Unit(benchmark::kMicrosecond);
BENCHMARK(WarpOpencvPiecewise)->Unit(benchmark::kMicrosecond);
BENCHMARK(WarpOpencvRemap)->Unit(benchmark::kMicrosecond);
BENCHMARK(BlendBgr24Engine)->Unit(benchmark::kMicrosecond);
BENCHMARK(BlendBgr24Opencv)->Unit(benchmark::kMicrosecond);
BENCHMARK(BlendNv21Engine)->Unit(benchmark::kMicrosecond);
BENCHMARK(BlendNv21Opencv)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace n3ds::bench

BENCHMARK_MAIN();
