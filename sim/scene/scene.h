// A synthetic camera scene for motion detection: a textured still background, objects that
// move over it, sensor noise, and the scene's brightness (a gain and an offset, as a light
// or auto-exposure changes it). It renders RGB frames and encodes them as JPEG with the
// simulator's encoder. The simulator's motion stream, the motion-engine tests and the
// motion benchmark's labelled sequences are made with it.
//
// Everything is drawn from a seeded generator: the same options and steps give the same
// frames. A Scene belongs to one thread at a time.

#ifndef EVWATCH_SIM_SCENE_SCENE_H_
#define EVWATCH_SIM_SCENE_SCENE_H_

#include <cstdint>
#include <string>
#include <vector>

namespace evsim {

struct SceneOptions {
  int width = 640;
  int height = 480;
  uint32_t seed = 1;
  double noise = 3.0;  // standard deviation of the sensor noise, luminance levels
  int quality = 75;    // JPEG quality of Jpeg()
};

// An object: a rectangle of a colour of its own with a check pattern (texture) around that
// colour, placed and sized in frame fractions (0..1 of the width and height). Its pattern
// moves with it.
struct SceneObject {
  double x = 0, y = 0;  // top-left corner
  double width = 0.1, height = 0.1;
  double dx = 0, dy = 0;  // motion per Step(), frame fractions
  bool bounce = true;     // reverse at the frame edges instead of leaving
};

class Scene {
 public:
  explicit Scene(const SceneOptions& options);
  Scene(const Scene&) = delete;
  Scene& operator=(const Scene&) = delete;

  int Width() const { return width_; }
  int Height() const { return height_; }

  // Adds an object and returns its index; its pattern and colours come from the seed.
  int AddObject(const SceneObject& object);
  SceneObject& Object(int index) { return objects_[static_cast<size_t>(index)].shape; }
  int ObjectCount() const { return static_cast<int>(objects_.size()); }

  // Brightness of the next frames: every level l becomes gain * l + offset (clipped).
  void SetBrightness(double gain, double offset);
  void SetNoise(double sigma) { noise_ = sigma; }

  // Moves every object by its motion (objects with dx = dy = 0 stay).
  void Step();

  // Renders the scene as it stands, with fresh noise: width x height x 3 bytes, RGB, rows
  // top-down. The reference stays valid until the next Render().
  const std::vector<uint8_t>& Render();
  // Render() encoded as a baseline JPEG (4:2:0, the options' quality).
  std::string Jpeg();

 private:
  struct Placed {
    SceneObject shape;
    uint8_t colour[2][3];  // the two colours of its pattern
    int cell;              // pattern cell size in pixels
  };

  uint32_t Random();
  void MakeBackground();
  void DrawObject(const Placed& object);

  const int width_, height_;
  const int quality_;
  double noise_;
  uint32_t state_;                   // xorshift generator state, never 0
  std::vector<uint8_t> background_;  // RGB, before brightness and noise
  std::vector<uint8_t> frame_;       // the last render
  std::vector<Placed> objects_;
  uint8_t brightness_[256];    // level -> level after gain and offset
  std::vector<int8_t> gauss_;  // noise samples for the current sigma
  double gauss_sigma_ = -1;    // the sigma gauss_ was made for
};

}  // namespace evsim

#endif  // EVWATCH_SIM_SCENE_SCENE_H_
