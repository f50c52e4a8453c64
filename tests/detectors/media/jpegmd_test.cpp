#include "detectors/media/jpegmd.h"

#include <sys/ipc.h>
#include <sys/shm.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"
#include "sim/scene/scene.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::Report;
using std::chrono::milliseconds;
using std::chrono::seconds;

// An engine that records every call as text and answers Detect from a script. One at a
// time: the function table reaches it through a global.
class FakeEngine {
 public:
  FakeEngine() { current_ = this; }
  ~FakeEngine() { current_ = nullptr; }

  static const MDEngineCalls* Calls() {
    static const MDEngineCalls calls = {
        [](MD_DETECTION*) { return current_->Log("create", 0); },
        [](MD_DETECTION*) { return current_->Log("finish", 0); },
        [](MD_DETECTION*, int v) {
          return current_->Log("sensitivity " + std::to_string(v), current_->set_result);
        },
        [](MD_DETECTION*, int v) {
          return current_->Log("threshold " + std::to_string(v), current_->set_result);
        },
        [](MD_DETECTION*, int v) { return current_->Log("fast " + std::to_string(v), 0); },
        [](MD_DETECTION*, const MD_RECT* r) {
          return current_->Log("range " + std::to_string(r->top) + " " + std::to_string(r->left) +
                                   " " + std::to_string(r->right) + " " +
                                   std::to_string(r->bottom) + " " + std::to_string(r->reserved),
                               current_->set_result);
        },
        [](MD_DETECTION*, const char* data, int length, int* level) {
          return current_->Detect(data, length, level);
        },
        [](MD_DETECTION*, int* v) {
          *v = 42;
          return current_->Log("get sensitivity", current_->get_result);
        },
        [](MD_DETECTION*, int* v) {
          *v = 17;
          return current_->Log("get threshold", current_->get_result);
        },
    };
    return &calls;
  }

  // Detect answers in order (result, level written; -1: none written); the last repeats.
  void Script(std::vector<std::pair<int, int>> answers) {
    std::lock_guard<std::mutex> lock(mutex_);
    answers_.assign(answers.begin(), answers.end());
  }
  std::vector<std::string> Log() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return log_;
  }
  void ClearLog() {
    std::lock_guard<std::mutex> lock(mutex_);
    log_.clear();
  }

  int set_result = 0;
  int get_result = 0;

 private:
  int Log(const std::string& call, int result) {
    std::lock_guard<std::mutex> lock(mutex_);
    log_.push_back(call);
    return result;
  }
  int Detect(const char* data, int length, int* level) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (data == nullptr) {
      log_.push_back("reset " + std::to_string(length) +
                     (level == nullptr ? " no level" : " level"));
      return 0;
    }
    log_.push_back("detect " + std::string(data, static_cast<size_t>(length)));
    std::pair<int, int> answer = answers_.empty() ? std::make_pair(4, 0) : answers_.front();
    if (answers_.size() > 1) answers_.pop_front();
    if (answer.second >= 0) *level = answer.second;
    return answer.first;
  }

  static FakeEngine* current_;
  mutable std::mutex mutex_;
  std::vector<std::string> log_;             // guarded by mutex_
  std::deque<std::pair<int, int>> answers_;  // guarded by mutex_
};

FakeEngine* FakeEngine::current_ = nullptr;

using Calls = std::vector<std::string>;

// A frame buffer in process memory.
class HeapBuffer {
 public:
  explicit HeapBuffer(uint32_t slots = 4, uint32_t capacity = 1 << 20)
      : memory_(new uint64_t[(StreamBuffer::RequiredBytes(slots, capacity) + 7) / 8]),
        buffer_(StreamBuffer::Format(memory_.get(), slots, capacity)) {}
  StreamBuffer* get() { return buffer_; }

 private:
  std::unique_ptr<uint64_t[]> memory_;
  StreamBuffer* buffer_;
};

// Writes the frames of a scene into a buffer every few milliseconds on its own thread; the
// scene's one object (in the band 0.2..0.55 of the height when it moves only sideways)
// moves only while Moving(true).
class SceneFeeder {
 public:
  explicit SceneFeeder(StreamBuffer* buffer, bool sideways_only = false)
      : buffer_(buffer), dy_(sideways_only ? 0 : 0.02) {
    evsim::SceneOptions options;
    options.width = 320;
    options.height = 240;
    scene_ = std::make_unique<evsim::Scene>(options);
    evsim::SceneObject object;
    object.x = object.y = 0.2;
    object.width = object.height = 0.35;
    object_ = scene_->AddObject(object);
    thread_ = std::thread([this] { Run(); });
  }
  ~SceneFeeder() {
    stop_ = true;
    thread_.join();
  }
  void Moving(bool moving) { moving_ = moving; }

 private:
  void Run() {
    while (!stop_) {
      evsim::SceneObject& o = scene_->Object(object_);
      o.dx = moving_ ? 0.03 : 0;
      o.dy = moving_ ? dy_ : 0;
      scene_->Step();
      const std::string frame = scene_->Jpeg();
      buffer_->Write(frame.data(), static_cast<uint32_t>(frame.size()), 7);
      std::this_thread::sleep_for(milliseconds(10));
    }
  }

  StreamBuffer* buffer_;
  const double dy_;
  std::unique_ptr<evsim::Scene> scene_;
  int object_ = 0;
  std::atomic<bool> moving_{false};
  std::atomic<bool> stop_{false};
  std::thread thread_;
};

CameraRecord Record(int id = 1, std::vector<MotionRegion> regions = {}) {
  CameraRecord r;
  r.host = "127.0.0.1";
  r.id = id;
  r.sensitivity = 90;
  r.threshold = 3;
  r.regions = std::move(regions);
  return r;
}

// Camera ids whose shared-memory keys no other test process uses.
int UniqueCameraId(int k) { return 0x3000000 + static_cast<int>(getpid()) * 4 + k; }
constexpr int kBufferIdBase = 524288;

bool AnyMotion(const std::vector<Report>& reports, size_t from = 0) {
  for (size_t i = from; i < reports.size(); ++i) {
    if (reports[i].state) return true;
  }
  return false;
}

// --- MD on a recording engine ---

TEST(MdTest, ConstructorSetsSensitivity90Threshold10AndFastMode) {
  FakeEngine engine;
  {
    MD md(FakeEngine::Calls());
    EXPECT_EQ(engine.Log(), (Calls{"create", "sensitivity 90", "threshold 10", "fast 1"}));
  }
  EXPECT_EQ(engine.Log().back(), "finish");
}

TEST(MdTest, AddRect1234HandsTheEngine21340) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.ClearLog();
  EXPECT_EQ(md.AddRect(1, 2, 3, 4), 0);
  _tag_MD_RECT rect = {5, 6, 7, 8, 9};
  EXPECT_EQ(md.AddRect(rect), 0);
  EXPECT_EQ(engine.Log(), (Calls{"range 2 1 3 4 0", "range 5 6 7 8 9"}));
  engine.set_result = 7;
  EXPECT_EQ(md.AddRect(1, 2, 3, 4), -1);
}

TEST(MdTest, SettersPassTheLowEightBitsAndFailOnAnEngineRefusal) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.ClearLog();
  EXPECT_EQ(md.SetSensitivity(0x164), 0);
  EXPECT_EQ(md.SetThreshold(-1), 0);
  engine.set_result = 1;
  EXPECT_EQ(md.SetSensitivity(101), -1);
  EXPECT_EQ(md.SetThreshold(300), -1);
  EXPECT_EQ(engine.Log(),
            (Calls{"sensitivity 100", "threshold 255", "sensitivity 101", "threshold 44"}));
}

TEST(MdTest, GettersReadTheEngineAndFailOnAnEngineError) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  int sensitivity = 0, threshold = 0;
  EXPECT_EQ(md.GetSensitivity(sensitivity), 0);
  EXPECT_EQ(md.GetThreshold(threshold), 0);
  EXPECT_EQ(sensitivity, 42);
  EXPECT_EQ(threshold, 17);
  engine.get_result = 2;
  EXPECT_EQ(md.GetSensitivity(sensitivity), -1);
  EXPECT_EQ(md.GetThreshold(threshold), -1);
}

TEST(MdTest, DetectPassesMotionAndNoMotionThrough) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.Script({{3, 55}, {4, 2}});
  engine.ClearLog();
  char frame[] = "abc";
  int level = -1;
  EXPECT_EQ(md.Detect(frame, 3, level), 3);
  EXPECT_EQ(level, 55);
  EXPECT_EQ(md.Detect(frame, 2, level), 4);
  EXPECT_EQ(level, 2);
  EXPECT_EQ(engine.Log(), (Calls{"detect abc", "detect ab"}));
}

TEST(MdTest, DetectMaps8To4WithoutAReset) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.Script({{8, -1}});
  engine.ClearLog();
  char frame[] = "ref";
  int level = -1;
  EXPECT_EQ(md.Detect(frame, 3, level), 4);
  EXPECT_EQ(level, 0);
  EXPECT_EQ(engine.Log(), (Calls{"detect ref"}));
}

TEST(MdTest, EngineResult5ResetsTheSequenceAndIsReturned) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.Script({{5, -1}, {1, 9}});
  engine.ClearLog();
  char frame[] = "bad";
  int level = -1;
  EXPECT_EQ(md.Detect(frame, 3, level), 5);
  EXPECT_EQ(level, 0);
  EXPECT_EQ(md.Detect(frame, 3, level), 1);
  EXPECT_EQ(level, 9);
  EXPECT_EQ(engine.Log(),
            (Calls{"detect bad", "reset 0 no level", "detect bad", "reset 0 no level"}));
}

TEST(MdTest, NullDataResetsAndGives4) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  engine.ClearLog();
  int level = -1;
  EXPECT_EQ(md.Detect(nullptr, 100, level), 4);
  EXPECT_EQ(level, 0);
  EXPECT_EQ(engine.Log(), (Calls{"reset 0 no level"}));
}

// --- the region set-up ---

TEST(ApplyMotionConfigTest, CameraWithoutRegionsGivesOneRangeOfTheWholeFrame) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  Camera camera(Record());
  engine.ClearLog();
  EXPECT_EQ(ApplyMotionConfig(&camera, &md), 0);
  EXPECT_EQ(engine.Log(), (Calls{"sensitivity 90", "threshold 3", "range 0 0 10000 10000 0"}));
}

TEST(ApplyMotionConfigTest, RegionsAreAddedInOrderWithTheirOwnSettings) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  CameraRecord record = Record(
      1, {MotionRegion("door", 100, 200, 300, 400), MotionRegion("gate", 5000, 0, 10000, 2500)});
  record.sensitivity = 70;
  record.threshold = 25;
  Camera camera(record);
  engine.ClearLog();
  EXPECT_EQ(ApplyMotionConfig(&camera, &md), 0);
  EXPECT_EQ(engine.Log(), (Calls{"sensitivity 70", "threshold 25", "range 200 100 300 400 0",
                                 "range 0 5000 10000 2500 0"}));
}

TEST(ApplyMotionConfigTest, NullCameraOrEngineGivesMinus1) {
  FakeEngine engine;
  MD md(FakeEngine::Calls());
  Camera camera(Record());
  engine.ClearLog();
  EXPECT_EQ(ApplyMotionConfig(nullptr, &md), -1);
  EXPECT_EQ(ApplyMotionConfig(&camera, nullptr), -1);
  EXPECT_TRUE(engine.Log().empty());
}

// --- JpegDiffMD ---

TEST(JpegDiffMDTest, SettingsGoThroughTheEngine) {
  Camera camera(Record());
  JpegDiffMD detector(&camera, nullptr, nullptr);
  EXPECT_EQ(detector.GetSensitivity(), 90);
  EXPECT_EQ(detector.GetThreshold(), 10);
  EXPECT_EQ(detector.SetSensitivity(0x150), 0);  // low 8 bits: 80
  EXPECT_EQ(detector.GetSensitivity(), 80);
  EXPECT_EQ(detector.SetThreshold(101), -1);
  EXPECT_EQ(detector.GetThreshold(), 10);
  EXPECT_EQ(detector.SetThreshold(0x100 + 20), 0);
  EXPECT_EQ(detector.GetThreshold(), 20);
}

TEST(JpegDiffMDTest, GetterGivesMinus1WhenTheEngineCannotAnswer) {
  FakeEngine engine;
  Camera camera(Record());
  JpegDiffMD detector(&camera, nullptr, nullptr, FakeEngine::Calls());
  engine.get_result = 3;
  EXPECT_EQ(detector.GetSensitivity(), -1);
  EXPECT_EQ(detector.GetThreshold(), -1);
}

TEST(JpegDiffMDTest, NullCameraReportsNothing) {
  EventBuf events;
  EventRecorder recorder(events);
  HeapBuffer buffer;
  JpegDiffMD detector(nullptr, buffer.get(), nullptr);
  ASSERT_EQ(detector.Init(&events, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  std::this_thread::sleep_for(milliseconds(100));
  EXPECT_TRUE(detector.IsStarted());
  EXPECT_EQ(detector.Stop(), 0);
  EXPECT_EQ(recorder.Size(), 0u);
}

TEST(JpegDiffMDTest, EngineResult5ResetsTheSequenceAndReportsNoMotion) {
  FakeEngine engine;
  engine.Script({{5, 6}});
  Camera camera(Record());
  HeapBuffer buffer;
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, buffer.get(), nullptr, FakeEngine::Calls());
  ASSERT_EQ(buffer.get()->Write("frame", 5, 3), 0);
  ASSERT_EQ(detector.Init(&events, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  detector.Stop();
  const std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{false, 6}));  // the engine's level, passed through
  for (size_t i = 1; i < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{false, 0}));
  const Calls log = engine.Log();
  // Set-up, then the one frame judged (skip bytes left out) and the reset after the error.
  EXPECT_EQ(Calls(log.begin() + 4, log.end()),
            (Calls{"sensitivity 90", "threshold 3", "range 0 0 10000 10000 0", "detect frame",
                   "reset 0 no level"}));
}

TEST(JpegDiffMDTest, EngineMotionIsReportedWithItsLevelAndTheRangesAreSetAtEachStart) {
  FakeEngine engine;
  engine.Script({{3, 40}, {8, -1}, {4, 1}});
  Camera camera(Record(1, {MotionRegion("a", 1, 2, 3, 4)}));
  HeapBuffer buffer;
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, buffer.get(), nullptr, FakeEngine::Calls());
  ASSERT_EQ(detector.Init(&events, 10), 0);
  for (int run = 0; run < 2; ++run) {
    engine.ClearLog();
    ASSERT_EQ(detector.Start(), 0);
    for (int i = 0; i < 3; ++i) {
      const size_t seen = recorder.Size();
      ASSERT_EQ(buffer.get()->Write("f", 1), 0);
      ASSERT_TRUE(
          recorder.WaitFor([&](const std::vector<Report>& r) { return r.size() >= seen + 2; }));
    }
    detector.Stop();
    const Calls log = engine.Log();
    ASSERT_GE(log.size(), 3u);
    EXPECT_EQ(Calls(log.begin(), log.begin() + 3),
              (Calls{"sensitivity 90", "threshold 3", "range 2 1 3 4 0"}));
  }
  std::vector<Report> reports = recorder.Reports();
  EXPECT_NE(std::find(reports.begin(), reports.end(), Report{true, 40}), reports.end());
  EXPECT_NE(std::find(reports.begin(), reports.end(), Report{false, 1}), reports.end());
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

TEST(JpegDiffMDTest, MovingSceneInAFrameBufferIsMotionAndAStillOneIsNot) {
  Camera camera(Record());
  HeapBuffer buffer;
  SceneFeeder feeder(buffer.get());
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, buffer.get(), nullptr);
  ASSERT_EQ(detector.Init(&events, 25), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(12));
  EXPECT_FALSE(AnyMotion(recorder.Reports())) << "a still scene is no motion";

  feeder.Moving(true);
  EXPECT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) {
    return !r.empty() && r.back().state && r.back().value >= 3;
  }));
  feeder.Moving(false);
  // Once the object has stopped for a few frames, the detector settles on no motion.
  size_t settled = 0;
  EXPECT_TRUE(recorder.WaitFor([&](const std::vector<Report>& r) {
    if (settled == 0 && !r.back().state) settled = r.size() + 8;
    return settled != 0 && r.size() >= settled + 12;
  }));
  EXPECT_FALSE(AnyMotion(recorder.Reports(), settled));
  detector.Stop();
  EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
}

TEST(JpegDiffMDTest, MotionOutsideTheCamerasRegionsIsNoMotion) {
  // The object moves sideways across the middle; the camera watches the floor only.
  Camera camera(Record(1, {MotionRegion("floor", 0, 7000, 10000, 10000)}));
  HeapBuffer buffer;
  SceneFeeder feeder(buffer.get(), true);
  feeder.Moving(true);
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, buffer.get(), nullptr);
  ASSERT_EQ(detector.Init(&events, 25), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(20));
  detector.Stop();
  EXPECT_FALSE(AnyMotion(recorder.Reports()));
}

TEST(JpegDiffMDTest, BufferInSharedMemoryIsAttachedByTheCameraIdAndDetachedAtTheEnd) {
  const int id = UniqueCameraId(0);
  StreamBuffer* shared = StreamBuffer::CreateShared(id + kBufferIdBase, 4, 1 << 20);
  ASSERT_NE(shared, nullptr);
  const int shmid = shmget(IPCKeyFromBufId(id + kBufferIdBase), 0, 0);
  ASSERT_GE(shmid, 0);
  auto attachments = [shmid] {
    struct shmid_ds info;
    return shmctl(shmid, IPC_STAT, &info) == 0 ? static_cast<int>(info.shm_nattch) : -1;
  };
  {
    Camera camera(Record(id));
    SceneFeeder feeder(shared);
    EventBuf events;
    EventRecorder recorder(events);
    JpegDiffMD detector(&camera, nullptr, nullptr);
    ASSERT_EQ(detector.Init(&events, 25), 0);
    ASSERT_EQ(detector.Start(), 0);
    ASSERT_TRUE(recorder.WaitForCount(6));
    EXPECT_EQ(attachments(), 2);
    feeder.Moving(true);
    EXPECT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.back().state; }));
    detector.Stop();
    EXPECT_EQ(attachments(), 1);
    EXPECT_EQ(recorder.Reports().back(), (Report{false, 0}));
  }
  StreamBuffer::DetachShared(shared);
  StreamBuffer::RemoveShared(id + kBufferIdBase);
}

TEST(JpegDiffMDTest, NoSharedBufferIsAPassWithoutAFrame) {
  const int id = UniqueCameraId(1);
  StreamBuffer::RemoveShared(id + kBufferIdBase);
  Camera camera(Record(id));
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, nullptr, nullptr);
  ASSERT_EQ(detector.Init(&events, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(3));
  detector.Stop();
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

TEST(JpegDiffMDTest, CorruptFramesInTheBufferAreNoMotion) {
  Camera camera(Record());
  HeapBuffer buffer;
  EventBuf events;
  EventRecorder recorder(events);
  JpegDiffMD detector(&camera, buffer.get(), nullptr);
  ASSERT_EQ(detector.Init(&events, 10), 0);
  ASSERT_EQ(detector.Start(), 0);
  for (const std::string& frame : {std::string("\xFF\xD8garbage", 9), std::string(5000, '\xFF')}) {
    const size_t seen = recorder.Size();
    ASSERT_EQ(buffer.get()->Write(frame.data(), static_cast<uint32_t>(frame.size())), 0);
    ASSERT_TRUE(
        recorder.WaitFor([&](const std::vector<Report>& r) { return r.size() >= seen + 3; }));
  }
  detector.Stop();
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

TEST(JpegDiffMDTest, ImageReadsTakeTheNextPartOfAStream) {
  evtest::FakeCamera cam;
  cam.Handle("/video.mjpg", [](evsim::HttpConnection& connection) {
    evtest::MultipartWriter writer(connection);
    writer.Begin();
    writer.Part("image/jpeg", "first");
    writer.Part("image/jpeg", "second part");
    connection.SleepFor(seconds(10));
  });
  Camera camera(Record());
  JpegDiffMD detector(&camera, nullptr, nullptr);
  MultipartFetch fetch("127.0.0.1", cam.Port(), "/video.mjpg", "", "", 5);
  int length = 0;
  ASSERT_EQ(detector.GetImageLen(&fetch, &length), 0);
  EXPECT_EQ(length, 5);
  // No buffer: the body is skipped and the read fails.
  EXPECT_EQ(detector.FetchImage(&fetch, nullptr, length), -1);
  ASSERT_EQ(detector.GetImageLen(&fetch, &length), 0);
  ASSERT_EQ(length, 11);
  std::string body(11, '\0');
  EXPECT_EQ(detector.FetchImage(&fetch, body.data(), length), 0);
  EXPECT_EQ(body, "second part");
  EXPECT_EQ(detector.GetImageLen(nullptr, &length), -1);
  EXPECT_EQ(detector.GetImageLen(&fetch, nullptr), -1);
  EXPECT_EQ(detector.FetchImage(nullptr, body.data(), 3), -1);
}

}  // namespace
