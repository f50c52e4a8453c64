// Frames per second that one core gets through JpgHdrDetector::DoED, the header parse of the
// JPEG header detectors (libjpeg reads markers up to the scan; nothing is decoded), for
// 640x480 and 1920x1080 frames that carry a JVC status comment. Items per second in the
// output are frames per second.

#include <benchmark/benchmark.h>

#include <random>
#include <string>
#include <vector>

#include "detectors/media/jpghdrdetector.h"
#include "sim/scene/mjpeg.h"

namespace {

// A frame of the given size with textured content, as a camera would send it.
std::string CameraFrame(int width, int height) {
  std::vector<unsigned char> pixels(static_cast<size_t>(width) * height * 3);
  std::mt19937 random(1);
  for (size_t i = 0; i < pixels.size(); ++i) {
    pixels[i] = static_cast<unsigned char>((i / 3 % width) / 4 + (random() & 31));
  }
  std::string com(256, '0');
  com[233] = '1';
  return evsim::EncodeJpeg(evsim::JpegImage{pixels.data(), width, height, 3},
                           {{evsim::kJpegCom, com}});
}

void BM_DoED(benchmark::State& state) {
  std::string frame = CameraFrame(static_cast<int>(state.range(0)), static_cast<int>(state.range(1)));
  if (frame.empty()) {
    state.SkipWithError("no frame");
    return;
  }
  JVCJpgMD detector(nullptr, nullptr, nullptr);
  for (auto _ : state) {
    unsigned int level = 0;
    const bool motion = detector.DoED(&frame[0], static_cast<int>(frame.size()), level);
    benchmark::DoNotOptimize(motion);
    if (!motion) {
      state.SkipWithError("flag not read");
      break;
    }
  }
  state.SetItemsProcessed(state.iterations());
  state.SetLabel(std::to_string(frame.size() / 1024) + " KiB frame");
}

BENCHMARK(BM_DoED)->Args({640, 480})->Args({1920, 1080});

}  // namespace

BENCHMARK_MAIN();
