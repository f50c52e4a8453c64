#include "sim/scene/scene.h"

#include <algorithm>
#include <cmath>
#include <cstring>

#include "sim/scene/mjpeg.h"

namespace evsim {
namespace {

constexpr int kNoiseSamples = 1 << 16;
constexpr int kFurniture = 40;  // rectangles of the background
constexpr int kTexture = 40;    // contrast of an object's pattern around its colour

uint8_t Clip(double v) { return static_cast<uint8_t>(std::clamp(std::lround(v), 0L, 255L)); }
uint8_t ClipInt(int v) { return static_cast<uint8_t>(std::clamp(v, 0, 255)); }

}  // namespace

Scene::Scene(const SceneOptions& options)
    : width_(std::max(1, options.width)),
      height_(std::max(1, options.height)),
      quality_(options.quality),
      noise_(options.noise),
      state_(options.seed == 0 ? 0x9E3779B9u : options.seed) {
  SetBrightness(1.0, 0.0);
  MakeBackground();
  frame_.resize(background_.size());
}

uint32_t Scene::Random() {
  uint32_t x = state_;
  x ^= x << 13;
  x ^= x >> 17;
  x ^= x << 5;
  state_ = x;
  return x;
}

void Scene::MakeBackground() {
  const size_t w = static_cast<size_t>(width_), h = static_cast<size_t>(height_);
  background_.resize(w * h * 3);
  // A wall over a floor: two gradients.
  for (size_t y = 0; y < h; ++y) {
    const bool floor = y > h * 3 / 5;
    const double t = static_cast<double>(y) / static_cast<double>(h);
    const uint8_t rgb[3] = {Clip(floor ? 90 + 60 * t : 170 - 50 * t),
                            Clip(floor ? 80 + 50 * t : 165 - 40 * t),
                            Clip(floor ? 60 + 40 * t : 150 - 30 * t)};
    for (size_t x = 0; x < w; ++x) std::memcpy(&background_[(y * w + x) * 3], rgb, 3);
  }
  // Furniture: rectangles of plain colours with a darker outline.
  for (int i = 0; i < kFurniture; ++i) {
    const size_t rw = w / 20 + Random() % (w / 4 + 1), rh = h / 20 + Random() % (h / 4 + 1);
    const size_t x0 = Random() % w, y0 = Random() % h;
    const uint8_t rgb[3] = {static_cast<uint8_t>(30 + Random() % 200),
                            static_cast<uint8_t>(30 + Random() % 200),
                            static_cast<uint8_t>(30 + Random() % 200)};
    for (size_t y = y0; y < std::min(h, y0 + rh); ++y) {
      for (size_t x = x0; x < std::min(w, x0 + rw); ++x) {
        uint8_t* p = &background_[(y * w + x) * 3];
        const bool edge = y == y0 || x == x0 || y + 1 == y0 + rh || x + 1 == x0 + rw;
        for (int c = 0; c < 3; ++c) p[c] = edge ? static_cast<uint8_t>(rgb[c] / 2) : rgb[c];
      }
    }
  }
  // Fine grain: a fixed texture of a few levels over 2x2 pixel grains, so that the frames
  // carry detail (and coefficients) as real pictures do.
  for (size_t y = 0; y < h; y += 2) {
    for (size_t x = 0; x < w; x += 2) {
      const int grain = static_cast<int>(Random() % 17) - 8;
      for (size_t yy = y; yy < std::min(h, y + 2); ++yy) {
        for (size_t xx = x; xx < std::min(w, x + 2); ++xx) {
          uint8_t* p = &background_[(yy * w + xx) * 3];
          for (int c = 0; c < 3; ++c) p[c] = ClipInt(p[c] + grain);
        }
      }
    }
  }
}

int Scene::AddObject(const SceneObject& object) {
  Placed placed;
  placed.shape = object;
  // A colour of its own with a texture around it, as clothes or a car have: the pattern's
  // two colours lie kTexture levels either side of the object's colour.
  for (int c = 0; c < 3; ++c) {
    const int base = static_cast<int>(Random() % 256);
    placed.colour[0][c] = ClipInt(base - kTexture);
    placed.colour[1][c] = ClipInt(base + kTexture);
  }
  placed.cell = 3 + static_cast<int>(Random() % 10);
  objects_.push_back(placed);
  return static_cast<int>(objects_.size()) - 1;
}

void Scene::SetBrightness(double gain, double offset) {
  for (int l = 0; l < 256; ++l) brightness_[l] = Clip(gain * l + offset);
}

void Scene::Step() {
  for (Placed& p : objects_) {
    SceneObject& o = p.shape;
    o.x += o.dx;
    o.y += o.dy;
    if (!o.bounce) continue;
    if (o.x < 0 || o.x + o.width > 1) {
      o.dx = -o.dx;
      o.x = std::clamp(o.x, 0.0, std::max(0.0, 1 - o.width));
    }
    if (o.y < 0 || o.y + o.height > 1) {
      o.dy = -o.dy;
      o.y = std::clamp(o.y, 0.0, std::max(0.0, 1 - o.height));
    }
  }
}

void Scene::DrawObject(const Placed& object) {
  const SceneObject& o = object.shape;
  const long x0 = std::lround(o.x * width_), y0 = std::lround(o.y * height_);
  const long x1 = std::lround((o.x + o.width) * width_),
             y1 = std::lround((o.y + o.height) * height_);
  for (long y = std::max(0L, y0); y < std::min<long>(height_, y1); ++y) {
    for (long x = std::max(0L, x0); x < std::min<long>(width_, x1); ++x) {
      // The pattern is fixed to the object, so it moves with it.
      const int which = (((x - x0) / object.cell) + ((y - y0) / object.cell)) & 1;
      std::memcpy(&frame_[(static_cast<size_t>(y) * width_ + x) * 3], object.colour[which], 3);
    }
  }
}

const std::vector<uint8_t>& Scene::Render() {
  std::memcpy(frame_.data(), background_.data(), background_.size());
  for (const Placed& p : objects_) DrawObject(p);

  if (gauss_sigma_ != noise_) {
    gauss_.resize(kNoiseSamples);
    // Box-Muller pairs, clipped to the int8 range.
    for (int i = 0; i < kNoiseSamples; i += 2) {
      const double u1 = (Random() % 1000000 + 1) / 1000001.0, u2 = (Random() % 1000000) / 1000000.0;
      const double r = std::sqrt(-2 * std::log(u1)) * noise_;
      gauss_[i] =
          static_cast<int8_t>(std::clamp(std::lround(r * std::cos(2 * M_PI * u2)), -127L, 127L));
      gauss_[i + 1] =
          static_cast<int8_t>(std::clamp(std::lround(r * std::sin(2 * M_PI * u2)), -127L, 127L));
    }
    gauss_sigma_ = noise_;
  }
  const size_t bytes = frame_.size();
  size_t i = 0;
  for (; i + 1 < bytes; i += 2) {
    const uint32_t r = Random();
    frame_[i] = ClipInt(brightness_[frame_[i]] + gauss_[r & 0xFFFF]);
    frame_[i + 1] = ClipInt(brightness_[frame_[i + 1]] + gauss_[r >> 16]);
  }
  for (; i < bytes; ++i) frame_[i] = ClipInt(brightness_[frame_[i]] + gauss_[Random() & 0xFFFF]);
  return frame_;
}

std::string Scene::Jpeg() {
  const std::vector<uint8_t>& pixels = Render();
  JpegOptions options;
  options.quality = quality_;
  return EncodeJpeg(JpegImage{pixels.data(), width_, height_, 3}, {}, options);
}

}  // namespace evsim
