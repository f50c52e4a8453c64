// The motion engine judged on labelled synthetic sequences, for speed and for quality.
//
// Sequences come from sim/scene (a textured room, sensor noise, light steps and exposure
// ramps, objects of several sizes and speeds inside and outside the watched ranges), at
// 640x480, 1280x720 and 1920x1080, JPEG quality 75, encoded before anything is timed.
//
// Speed, on one core (the process is pinned to one CPU and the figures are the thread's CPU
// time, so other work on the machine does not count): frames per second of the engine
// (MD_DetectMotionSeq) in fast and normal mode, beside libjpeg-turbo decoding the same
// frames at the engine's scale and doing nothing else (the floor), beside fast mode's own
// decoder (DcLumaDecoder, DC coefficients only) doing nothing else, and beside the
// customary OpenCV pipeline: full decode, grey, Gaussian blur 21x21, absdiff with the
// previous frame, threshold 25, count of changed pixels in the watched area; also with a
// 5x5 blur, which is faster and finds more. Each figure is the best of several passes.
//
// Quality: every frame but a sequence's first is labelled motion when an object inside
// the watched ranges moved since the previous frame. Both detectors say motion from 1% of
// the watched area (engine: threshold 1 at its default sensitivity 90; OpenCV: changed
// pixels >= 1% of the mask). Frame-level precision, recall and F1 are printed per
// resolution, with each sequence's false positives and false negatives.
//
// The OpenCV columns exist when the program was built with OpenCV (make bench installs
// it); otherwise they read "n/a". Tables are printed as Markdown.

#include <sched.h>
#include <time.h>

#include <algorithm>
#include <cmath>
#include <csetjmp>
#include <cstdio>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "host/jpeg/dcluma.h"
#include "framework/host/jpegsrc.h"
#include "framework/host/mdengine.h"
#include "sim/scene/scene.h"

#ifdef EVW_HAVE_OPENCV
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#endif

namespace {

constexpr int kFrames = 96;       // frames per quality sequence
constexpr int kSpeedFrames = 48;  // frames of the speed sequence
constexpr double kMinPassSeconds = 0.4;
constexpr int kPasses = 3;
constexpr int kLevelThreshold = 1;  // percent of the watched area

struct Resolution {
  int width, height;
  const char* name;
};
const Resolution kResolutions[] = {
    {640, 480, "640x480"}, {1280, 720, "1280x720"}, {1920, 1080, "1920x1080"}};

// A labelled sequence of JPEG frames.
struct Clip {
  std::string name;
  std::vector<std::string> frames;
  std::vector<bool> motion;     // per frame; frame 0 is the reference
  std::vector<MD_RECT> ranges;  // empty: the whole frame
};

// An object that goes back and forth along x between lo and hi (frame fractions of its
// left edge) at `speed` per frame, moving `run` frames and resting `rest` frames.
struct Patrol {
  int object;
  double lo, hi, speed;
  int run, rest;
  int phase = 0;  // frames into the current run + rest
  double direction = 1;

  // Moves the object for frame t; true when it moved.
  bool Step(evsim::Scene& scene) {
    const bool moving = phase < run;
    phase = (phase + 1) % (run + rest);
    if (!moving) return false;
    evsim::SceneObject& o = scene.Object(object);
    double x = o.x + direction * speed;
    if (x > hi || x < lo) {
      direction = -direction;
      x = std::clamp(x, lo, hi);
    }
    const bool moved = std::fabs(x - o.x) > 1e-9;
    o.x = x;
    return moved;
  }
};

int AddObject(evsim::Scene& scene, double x, double y, double w, double h) {
  evsim::SceneObject o;
  o.x = x;
  o.y = y;
  o.width = w;
  o.height = h;
  o.bounce = false;
  return scene.AddObject(o);
}

// How one sequence unfolds: set-up, then one call per frame that changes the scene and
// says whether that frame shows motion in the watched area.
struct Script {
  std::string name;
  double noise;
  std::vector<MD_RECT> ranges;
  std::function<std::function<bool(evsim::Scene&, int)>(evsim::Scene&)> setup;
};

const MD_RECT kLeftHalf = {0, 0, 5000, 10000, 0};

std::vector<Script> Scripts() {
  std::vector<Script> s;
  s.push_back({"still, noise 3", 3.0, {}, [](evsim::Scene&) {
                 return [](evsim::Scene&, int) { return false; };
               }});
  s.push_back({"still, noise 8", 8.0, {}, [](evsim::Scene&) {
                 return [](evsim::Scene&, int) { return false; };
               }});
  s.push_back({"light steps", 3.0, {}, [](evsim::Scene&) {
                 return [](evsim::Scene& scene, int t) {
                   const double steps[][2] = {{1.0, 0}, {1.35, 0}, {1.0, 0},
                                              {0.7, 0}, {0.7, 25}, {1.0, -20}};
                   const int k = std::min(5, t / 16);
                   scene.SetBrightness(steps[k][0], steps[k][1]);
                   return false;
                 };
               }});
  s.push_back({"exposure ramp", 4.0, {}, [](evsim::Scene&) {
                 return [](evsim::Scene& scene, int t) {
                   scene.SetBrightness(1.0 + 0.3 * std::sin(2 * M_PI * t / 60.0), 0);
                   return false;
                 };
               }});
  s.push_back({"small object, medium speed", 3.0, {}, [](evsim::Scene& scene) {
                 Patrol p{AddObject(scene, 0.2, 0.5, 0.12, 0.16), 0.05, 0.8, 0.015, 12, 12};
                 return [p](evsim::Scene& sc, int) mutable { return p.Step(sc); };
               }});
  s.push_back({"medium object, slow", 3.0, {}, [](evsim::Scene& scene) {
                 Patrol p{AddObject(scene, 0.3, 0.3, 0.22, 0.3), 0.05, 0.7, 0.004, 20, 10};
                 return [p](evsim::Scene& sc, int) mutable { return p.Step(sc); };
               }});
  s.push_back({"large object, fast", 3.0, {}, [](evsim::Scene& scene) {
                 Patrol p{AddObject(scene, 0.1, 0.2, 0.35, 0.45), 0.0, 0.65, 0.05, 8, 8};
                 return [p](evsim::Scene& sc, int) mutable { return p.Step(sc); };
               }});
  s.push_back({"object outside the ranges", 3.0, {kLeftHalf}, [](evsim::Scene& scene) {
                 Patrol outside{AddObject(scene, 0.6, 0.2, 0.3, 0.4), 0.55, 0.7, 0.02, 30, 0};
                 Patrol inside{AddObject(scene, 0.1, 0.6, 0.15, 0.2), 0.0, 0.35, 0.015, 10, 14};
                 return [outside, inside](evsim::Scene& sc, int) mutable {
                   outside.Step(sc);
                   return inside.Step(sc);
                 };
               }});
  s.push_back({"object and light steps", 3.0, {}, [](evsim::Scene& scene) {
                 Patrol p{AddObject(scene, 0.2, 0.4, 0.2, 0.25), 0.05, 0.75, 0.02, 10, 10};
                 return [p](evsim::Scene& sc, int t) mutable {
                   sc.SetBrightness((t / 15) % 2 ? 1.3 : 1.0, 0);
                   return p.Step(sc);
                 };
               }});
  s.push_back({"object, noise 8, ramp", 8.0, {}, [](evsim::Scene& scene) {
                 Patrol p{AddObject(scene, 0.4, 0.3, 0.18, 0.25), 0.05, 0.75, 0.02, 14, 10};
                 return [p](evsim::Scene& sc, int t) mutable {
                   sc.SetBrightness(1.0 - 0.25 * std::sin(2 * M_PI * t / 48.0), 0);
                   return p.Step(sc);
                 };
               }});
  return s;
}

Clip MakeClip(const Script& script, const Resolution& r, uint32_t seed, int frames) {
  evsim::SceneOptions options;
  options.width = r.width;
  options.height = r.height;
  options.seed = seed;
  options.noise = script.noise;
  evsim::Scene scene(options);
  auto step = script.setup(scene);
  Clip clip;
  clip.name = script.name;
  clip.ranges = script.ranges;
  for (int t = 0; t < frames; ++t) {
    const bool moved = step(scene, t);
    clip.motion.push_back(t > 0 && moved);
    clip.frames.push_back(scene.Jpeg());
  }
  return clip;
}

// --- the detectors under test ---

// A detector judges the frames of a clip in order: true for motion.
class Detector {
 public:
  virtual ~Detector() = default;
  virtual void Begin(const Clip& clip) = 0;
  virtual bool Judge(const std::string& frame) = 0;
};

class Engine : public Detector {
 public:
  explicit Engine(bool fast) : fast_(fast) {}
  ~Engine() override { Finish(); }

  // A clip with the ranges of the last one only starts a new sequence, as a camera's
  // engine would after a pause: the engine, with its Huffman tables, stays.
  void Begin(const Clip& clip) override {
    if (state_.engine != nullptr && SameRanges(clip.ranges)) {
      MD_DetectMotionSeq(&state_, nullptr, 0, nullptr);
      return;
    }
    Finish();
    MD_CreateDetection(&state_);
    MD_EnableFastMD(&state_, fast_ ? 1 : 0);
    MD_SetMDThreshold(&state_, kLevelThreshold);
    for (const MD_RECT& r : clip.ranges) MD_SetDetectRange(&state_, &r);
    ranges_ = clip.ranges;
  }
  bool Judge(const std::string& frame) override {
    int level = 0;
    return MD_DetectMotionSeq(&state_, frame.data(), static_cast<int>(frame.size()), &level) ==
           MD_MOTION;
  }

 private:
  void Finish() {
    if (state_.engine != nullptr) MD_FinishDetection(&state_);
  }

  bool SameRanges(const std::vector<MD_RECT>& ranges) const {
    return std::equal(ranges.begin(), ranges.end(), ranges_.begin(), ranges_.end(),
                      [](const MD_RECT& a, const MD_RECT& b) {
                        return a.top == b.top && a.left == b.left && a.right == b.right &&
                               a.bottom == b.bottom;
                      });
  }

  const bool fast_;
  MD_DETECTION state_{nullptr};
  std::vector<MD_RECT> ranges_;  // those of the engine's clip
};

// A decoder alone, doing nothing else: libjpeg-turbo at 1/denominator scale (the floor),
// or fast mode's DcLumaDecoder after libjpeg has read the header.
class Floor : public Detector {
 public:
  enum Decoder { kLibrary, kDcLuma };
  Floor(int denominator, Decoder decoder = kLibrary)
      : denominator_(denominator), decoder_(decoder) {
    SetJpegExit(&cinfo_, &error_);
    jpeg_CreateDecompress(&cinfo_, JPEG_LIB_VERSION, sizeof(cinfo_));
  }
  ~Floor() override { jpeg_destroy_decompress(&cinfo_); }

  void Begin(const Clip&) override {}
  bool Judge(const std::string& frame) override {
    Decode(frame);
    return false;
  }
  // Frames DcLumaDecoder left undecoded: only the first is expected (its Huffman tables
  // are new; they are made when the second frame brings them again).
  long Refused() const { return refused_; }

 private:
  void Decode(const std::string& frame) {
    error_.mgr.num_warnings = 0;
    if (setjmp(error_.jump) != 0) {
      jpeg_abort_decompress(&cinfo_);
      return;
    }
    JpegMemSrc(&cinfo_, reinterpret_cast<const unsigned char*>(frame.data()), frame.size());
    jpeg_read_header(&cinfo_, TRUE);
    cinfo_.scale_num = 1;
    cinfo_.scale_denom = static_cast<unsigned int>(denominator_);
    cinfo_.out_color_space = JCS_GRAYSCALE;
    jpeg_calc_output_dimensions(&cinfo_);
    const size_t bytes = static_cast<size_t>(cinfo_.output_width) * cinfo_.output_height;
    if (pixels_.size() < bytes) pixels_.resize(bytes);
    if (decoder_ == kDcLuma) {
      if (!dc_luma_.Decode(cinfo_, pixels_.data(), static_cast<int>(cinfo_.output_width),
                           static_cast<int>(cinfo_.output_height))) {
        ++refused_;
      }
      jpeg_abort_decompress(&cinfo_);
      return;
    }
    jpeg_start_decompress(&cinfo_);
    while (cinfo_.output_scanline < cinfo_.output_height) {
      JSAMPROW row =
          pixels_.data() + static_cast<size_t>(cinfo_.output_scanline) * cinfo_.output_width;
      jpeg_read_scanlines(&cinfo_, &row, 1);
    }
    jpeg_finish_decompress(&cinfo_);
  }

  const int denominator_;
  const Decoder decoder_;
  JpegErrorJump error_;
  jpeg_decompress_struct cinfo_;
  DcLumaDecoder dc_luma_;
  std::vector<uint8_t> pixels_;
  long refused_ = 0;
};

#ifdef EVW_HAVE_OPENCV
class OpenCvPipeline : public Detector {
 public:
  explicit OpenCvPipeline(int kernel = 21) : kernel_(kernel) {}

  void Begin(const Clip& clip) override {
    ranges_ = clip.ranges;
    previous_.release();
    mask_.release();
  }
  bool Judge(const std::string& frame) override {
    const cv::Mat data(1, static_cast<int>(frame.size()), CV_8UC1, const_cast<char*>(frame.data()));
    cv::Mat colour = cv::imdecode(data, cv::IMREAD_COLOR);
    cv::Mat grey, blurred;
    cv::cvtColor(colour, grey, cv::COLOR_BGR2GRAY);
    cv::GaussianBlur(grey, blurred, cv::Size(kernel_, kernel_), 0);
    if (mask_.empty()) MakeMask(blurred.cols, blurred.rows);
    bool motion = false;
    if (!previous_.empty()) {
      cv::absdiff(blurred, previous_, diff_);
      cv::threshold(diff_, diff_, 25, 255, cv::THRESH_BINARY);
      cv::bitwise_and(diff_, mask_, diff_);
      motion = cv::countNonZero(diff_) * 100 >= kLevelThreshold * watched_;
    }
    previous_ = blurred;
    return motion;
  }

 private:
  void MakeMask(int width, int height) {
    if (ranges_.empty()) {
      mask_ = cv::Mat(height, width, CV_8UC1, cv::Scalar(255));
    } else {
      mask_ = cv::Mat(height, width, CV_8UC1, cv::Scalar(0));
      for (const MD_RECT& r : ranges_) {
        cv::Rect rect(r.left * width / 10000, r.top * height / 10000,
                      (r.right - r.left) * width / 10000, (r.bottom - r.top) * height / 10000);
        mask_(rect).setTo(255);
      }
    }
    watched_ = cv::countNonZero(mask_);
  }

  const int kernel_;  // Gaussian blur kernel size
  std::vector<MD_RECT> ranges_;
  cv::Mat previous_, mask_, diff_;
  int watched_ = 0;
};
#endif

// --- measuring ---

// CPU time of the calling thread: what one core spent, whatever else the machine runs.
double ThreadSeconds() {
  timespec t;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
  return static_cast<double>(t.tv_sec) + t.tv_nsec * 1e-9;
}

// Frames per second of one timed pass of at least kMinPassSeconds of CPU time.
double PassFramesPerSecond(Detector& detector, const Clip& clip) {
  long frames = 0;
  const double start = ThreadSeconds();
  double seconds = 0;
  do {
    detector.Begin(clip);
    for (const std::string& f : clip.frames) detector.Judge(f);
    frames += static_cast<long>(clip.frames.size());
    seconds = ThreadSeconds() - start;
  } while (seconds < kMinPassSeconds);
  return frames / seconds;
}

// Best frames per second of each detector over kPasses rounds; the detectors take turns
// within a round, so a slow spell of the machine touches them alike.
std::vector<double> FramesPerSecond(const std::vector<Detector*>& detectors, const Clip& clip) {
  std::vector<double> best(detectors.size(), 0.0);
  for (int pass = 0; pass < kPasses; ++pass) {
    for (size_t i = 0; i < detectors.size(); ++i) {
      best[i] = std::max(best[i], PassFramesPerSecond(*detectors[i], clip));
    }
  }
  return best;
}

struct Score {
  int tp = 0, fp = 0, fn = 0, tn = 0;
  void Add(const Score& o) {
    tp += o.tp;
    fp += o.fp;
    fn += o.fn;
    tn += o.tn;
  }
  double Precision() const { return tp + fp ? static_cast<double>(tp) / (tp + fp) : 1.0; }
  double Recall() const { return tp + fn ? static_cast<double>(tp) / (tp + fn) : 1.0; }
  double F1() const {
    const double p = Precision(), r = Recall();
    return p + r > 0 ? 2 * p * r / (p + r) : 0.0;
  }
};

Score Judge(Detector& detector, const Clip& clip) {
  Score s;
  detector.Begin(clip);
  for (size_t i = 0; i < clip.frames.size(); ++i) {
    const bool said = detector.Judge(clip.frames[i]);
    if (i == 0) continue;  // the reference
    if (said && clip.motion[i]) ++s.tp;
    if (said && !clip.motion[i]) ++s.fp;
    if (!said && clip.motion[i]) ++s.fn;
    if (!said && !clip.motion[i]) ++s.tn;
  }
  return s;
}

void PinToOneCore() {
  cpu_set_t set;
  CPU_ZERO(&set);
  const int cpu = sched_getcpu();
  CPU_SET(cpu < 0 ? 0 : cpu, &set);
  sched_setaffinity(0, sizeof(set), &set);
#ifdef EVW_HAVE_OPENCV
  cv::setNumThreads(1);
#endif
}

std::string Fixed(double v, int digits) {
  char text[32];
  std::snprintf(text, sizeof(text), "%.*f", digits, v);
  return text;
}

void SpeedTable() {
  std::printf("### Speed (frames per second on one core, CPU time)\n\n");
  std::printf(
      "| Frames | Floor 1/8 | DC decoder alone | Engine fast | Fast / floor time | "
      "Fast / DC decoder time | Floor 1/4 | Engine normal | Normal / floor time | OpenCV 21x21 | "
      "OpenCV 5x5 | Fast vs OpenCV 21x21 | Fast vs OpenCV 5x5 |\n");
  std::printf("|---|---|---|---|---|---|---|---|---|---|---|---|---|\n");
  const Script moving = Scripts()[6];
  for (const Resolution& r : kResolutions) {
    const Clip clip = MakeClip(moving, r, 7, kSpeedFrames);
    Engine fast(true), normal(false);
    Floor eighth(8), quarter(4);
    Floor dc(8, Floor::kDcLuma);
    std::vector<Detector*> detectors = {&eighth, &dc, &fast, &quarter, &normal};
#ifdef EVW_HAVE_OPENCV
    OpenCvPipeline customary(21), light(5);
    detectors.push_back(&customary);
    detectors.push_back(&light);
#endif
    const std::vector<double> fps = FramesPerSecond(detectors, clip);
    if (dc.Refused() > 1) {
      std::fprintf(stderr, "bench_motion: the DC decoder left %ld frames to the library\n",
                   dc.Refused());
    }
    std::string cv21 = "n/a", cv5 = "n/a", versus21 = "n/a", versus5 = "n/a";
    if (fps.size() == 7) {
      cv21 = Fixed(fps[5], 0);
      cv5 = Fixed(fps[6], 0);
      versus21 = Fixed(fps[2] / fps[5], 1) + "x";
      versus5 = Fixed(fps[2] / fps[6], 1) + "x";
    }
    std::printf("| %s | %.0f | %.0f | %.0f | %.3f | %.3f | %.0f | %.0f | %.3f | %s | %s | %s | %s |\n",
                r.name, fps[0], fps[1], fps[2], fps[0] / fps[2], fps[1] / fps[2], fps[3], fps[4],
                fps[3] / fps[4], cv21.c_str(), cv5.c_str(), versus21.c_str(), versus5.c_str());
    std::fflush(stdout);
  }
  std::printf("\n");
}

void QualityTable() {
  std::printf("### Quality (frame level, %d sequences of %d frames per resolution)\n\n",
              static_cast<int>(Scripts().size()), kFrames);
  std::printf("| Frames | Detector | Precision | Recall | F1 | FP / FN per sequence |\n");
  std::printf("|---|---|---|---|---|---|\n");
  const std::vector<Script> scripts = Scripts();
  for (const Resolution& r : kResolutions) {
    std::vector<Clip> clips;
    uint32_t seed = 100;
    for (const Script& s : scripts) clips.push_back(MakeClip(s, r, seed++, kFrames));

    std::vector<std::pair<std::string, std::unique_ptr<Detector>>> detectors;
    detectors.emplace_back("engine, fast", std::make_unique<Engine>(true));
    detectors.emplace_back("engine, normal", std::make_unique<Engine>(false));
#ifdef EVW_HAVE_OPENCV
    detectors.emplace_back("OpenCV pipeline", std::make_unique<OpenCvPipeline>());
    detectors.emplace_back("OpenCV, blur 5x5", std::make_unique<OpenCvPipeline>(5));
#endif
    for (auto& [name, detector] : detectors) {
      Score total;
      std::string errors;
      for (const Clip& clip : clips) {
        const Score s = Judge(*detector, clip);
        total.Add(s);
        errors += (errors.empty() ? "" : " ") + std::to_string(s.fp) + "/" + std::to_string(s.fn);
      }
      std::printf("| %s | %s | %.3f | %.3f | %.3f | %s |\n", r.name, name.c_str(),
                  total.Precision(), total.Recall(), total.F1(), errors.c_str());
      std::fflush(stdout);
    }
  }
  std::printf("\nSequences, in the order of the last column:");
  for (size_t i = 0; i < scripts.size(); ++i) {
    std::printf("%s %s", i ? ";" : "", scripts[i].name.c_str());
  }
  std::printf(".\n");
#ifndef EVW_HAVE_OPENCV
  std::printf("OpenCV was not found when this program was built: its columns read n/a.\n");
#endif
}

}  // namespace

// With an argument "speed" or "quality" only that table is made.
int main(int argc, char** argv) {
  const std::string only = argc > 1 ? argv[1] : "";
  PinToOneCore();
  if (only.empty() || only == "speed") SpeedTable();
  if (only.empty() || only == "quality") QualityTable();
  return 0;
}
