// The daemon's frame reception: one receiver per camera copies the camera's multipart stream
// into the camera's frame buffer in shared memory, where detectors take it by pointer or
// attach it by key; the runner hands that buffer to every entry with stream_buffer: true.

#include "apps/evwatch/framereceiver.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <sstream>
#include <string>
#include <thread>

#include "apps/evwatch/config.h"
#include "apps/evwatch/runner.h"
#include "apps/evwatch/sink.h"
#include "framework/host/streambuffer.h"
#include "sim/scene/mjpeg.h"
#include "tests/support/fakecamera.h"

namespace evwatch {
namespace {

using evtest::FakeCamera;
using evtest::MultipartWriter;
using std::chrono::milliseconds;
using std::chrono::seconds;

const char kFrames[] = "/video.mjpg";

// Camera ids of this process only, so that test programs running at once never share a
// segment.
int UniqueCameraId(int n) { return (getpid() % 100000) * 10 + n; }

std::string JvcFrame(char flag) {
  std::string com(256, '0');
  com[233] = flag;
  return evsim::EncodeGreyJpeg(32, 24, 90, {{evsim::kJpegCom, com}});
}

// The newest frame in the buffer (empty when none), read as a detector would.
std::string Newest(StreamBuffer* buffer) {
  DataUnit* unit = buffer->ReadLatest(nullptr);
  if (unit == nullptr) return "";
  std::string frame(unit->Frame(), unit->FrameLength());
  buffer->ReadFinish(unit, false);
  return frame;
}

class FrameReceiverTest : public ::testing::Test {
 protected:
  // The camera pushes `frames` in turn (the last repeats) every 5 ms.
  void Serve(std::vector<std::string> frames) {
    cam_.Handle(kFrames, [frames](evsim::HttpConnection& connection) {
      MultipartWriter writer(connection, "frame");
      if (!writer.Begin()) return;
      for (size_t i = 0;; ++i) {
        const std::string& f = frames[i < frames.size() ? i : frames.size() - 1];
        if (!writer.Part("image/jpeg", f) || !connection.SleepFor(milliseconds(5))) return;
      }
    });
  }

  Camera MakeCamera(int n) {
    CameraRecord record = cam_.Record("viewer", "secret");
    record.id = UniqueCameraId(n);
    return Camera(record);
  }

  FakeCamera cam_;
};

TEST_F(FrameReceiverTest, WritesEachFrameIntoTheSharedBufferOfTheCamerasKey) {
  cam_.RequireAuth(evsim::AuthScheme::kBasic, "viewer", "secret");
  const std::string frame = JvcFrame('1');
  Serve({frame});
  Camera camera = MakeCamera(1);
  std::unique_ptr<FrameReceiver> receiver = FrameReceiver::Create(camera, {kFrames, cam_.Port()});
  ASSERT_NE(receiver, nullptr);
  ASSERT_TRUE(receiver->SharedMemory());
  EXPECT_EQ(receiver->BufferId(), camera.GetId() + 524288);
  ASSERT_TRUE(receiver->Start());
  ASSERT_TRUE(receiver->WaitForFrame(std::chrono::steady_clock::now() + seconds(10)));
  EXPECT_EQ(Newest(receiver->Buffer()), frame);

  // Another reader attaches the same buffer by key, as the software motion detector does.
  StreamBuffer* attached = StreamBuffer::AttachShared(camera.GetId() + 524288);
  ASSERT_NE(attached, nullptr);
  EXPECT_EQ(Newest(attached), frame);
  StreamBuffer::DetachShared(attached);

  receiver.reset();
  EXPECT_EQ(StreamBuffer::AttachShared(camera.GetId() + 524288), nullptr) << "the segment is removed";
  // One stream, opened with the camera's credentials (after the camera's challenge).
  int authorized = 0;
  for (const evtest::SeenRequest& r : cam_.Requests()) authorized += r.Header("Authorization").empty() ? 0 : 1;
  EXPECT_EQ(authorized, 1);
}

TEST_F(FrameReceiverTest, FollowsTheStreamAndSkipsPartsTooLongForASlot) {
  const std::string on = JvcFrame('1');
  const std::string off = JvcFrame('0');
  const std::string oversized(FrameReceiver::kFrameCapacity + 1, 'x');
  Serve({off, oversized, on});
  Camera camera = MakeCamera(2);
  std::unique_ptr<FrameReceiver> receiver = FrameReceiver::Create(camera, {kFrames, cam_.Port()});
  ASSERT_NE(receiver, nullptr);
  ASSERT_TRUE(receiver->Start());
  const auto deadline = std::chrono::steady_clock::now() + seconds(10);
  while (Newest(receiver->Buffer()) != on && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(milliseconds(5));
  }
  EXPECT_EQ(Newest(receiver->Buffer()), on);
  receiver->Stop();
  const uint64_t frames = receiver->Frames();
  EXPECT_GE(frames, 2u);
  // Stopped: nothing is written any more, and the buffer stays readable until destruction.
  std::this_thread::sleep_for(milliseconds(50));
  EXPECT_EQ(receiver->Frames(), frames);
  EXPECT_EQ(Newest(receiver->Buffer()), on);
  EXPECT_EQ(cam_.Count(kFrames), 1) << "an oversized part is passed over, not a failed read";
}

TEST_F(FrameReceiverTest, ACameraThatNeverSendsAFrameIsWaitedForOnlyUntilTheDeadline) {
  cam_.Answer(kFrames, evtest::Respond(404, "text/plain", "no\r\n"));
  Camera camera = MakeCamera(3);
  std::unique_ptr<FrameReceiver> receiver = FrameReceiver::Create(camera, {kFrames, cam_.Port()});
  ASSERT_NE(receiver, nullptr);
  ASSERT_TRUE(receiver->Start());
  EXPECT_FALSE(receiver->WaitForFrame(std::chrono::steady_clock::now() + milliseconds(300)));
  ASSERT_TRUE(cam_.WaitForRequests(1));
  receiver->Stop();
  EXPECT_EQ(receiver->Frames(), 0u);
  EXPECT_EQ(Newest(receiver->Buffer()), "");
}

TEST_F(FrameReceiverTest, RunnerRunsOneReceiverPerCameraForEveryBufferReader) {
  Serve({JvcFrame('1')});
  const int id = UniqueCameraId(4);
  std::ostringstream text;
  text << "cameras:\n"
       << "  - name: door\n"
       << "    host: 127.0.0.1\n"
       << "    port: " << cam_.Port() << "\n"
       << "    id: " << id << "\n"
       << "    frames: {path: " << kFrames << "}\n"
       << "    api: {stream: {path: /jvc/stream}}\n"
       << "    detectors:\n"
       << "      - {class: JVCJpgMD, name: a, stream_buffer: true}\n"
       << "      - {class: JVCJpgMD, name: b, stream_buffer: true}\n"
       << "      - {class: VivotekJpgMD, name: c, stream_buffer: true, function_group: 1}\n";
  std::string error;
  std::optional<Config> config = ParseConfig(text.str(), "frames.yaml", &error);
  ASSERT_TRUE(config.has_value()) << error;

  std::ostringstream out, log;
  Sink sink(out, OutputFormat::kJsonl, false);
  {
    Runner runner(*config, sink, log);
    ASSERT_TRUE(runner.Start(&error)) << error;
    // While it runs the buffer can be attached by the camera's key.
    StreamBuffer* attached = StreamBuffer::AttachShared(id + 524288);
    ASSERT_NE(attached, nullptr);
    StreamBuffer::DetachShared(attached);
    std::this_thread::sleep_for(milliseconds(200));
    runner.Stop();
  }
  EXPECT_EQ(StreamBuffer::AttachShared(id + 524288), nullptr) << "the segment is removed";
  EXPECT_EQ(cam_.Count(kFrames), 1) << "one receiver for the camera, however many readers";
  EXPECT_EQ(cam_.Count("/jvc/stream"), 0) << "buffer readers open no stream of their own";
  EXPECT_TRUE(log.str().empty()) << log.str();

  // The receiver had a frame in before the detectors started: their first reports read it.
  std::istringstream lines(out.str());
  std::map<std::string, std::vector<std::string>> by;
  for (std::string line; std::getline(lines, line);) {
    for (const char* name : {"\"a\"", "\"b\"", "\"c\""}) {
      if (line.find(name) != std::string::npos) by[name].push_back(line);
    }
  }
  ASSERT_EQ(by.size(), 3u) << out.str();
  EXPECT_NE(by["\"a\""].front().find("\"state\":true"), std::string::npos) << by["\"a\""].front();
  EXPECT_NE(by["\"b\""].front().find("\"state\":true"), std::string::npos) << by["\"b\""].front();
  // The Vivotek reader finds no APP2 record in these frames.
  EXPECT_NE(by["\"c\""].front().find("\"state\":false"), std::string::npos) << by["\"c\""].front();
}

TEST_F(FrameReceiverTest, RunnerSaysWhenACameraSendsNoFrameInTime) {
  cam_.Answer(kFrames, evtest::Respond(404, "text/plain", "no\r\n"));
  std::ostringstream text;
  text << "cameras:\n"
       << "  - {name: door, host: 127.0.0.1, port: " << cam_.Port() << ", id: " << UniqueCameraId(5)
       << ", password: hidden-pw, frames: {path: " << kFrames << "},"
       << " detectors: [{class: JVCJpgMD, stream_buffer: true}]}\n";
  std::string error;
  std::optional<Config> config = ParseConfig(text.str(), "frames.yaml", &error);
  ASSERT_TRUE(config.has_value()) << error;
  std::ostringstream out, log;
  Sink sink(out, OutputFormat::kJsonl, false);
  Runner runner(*config, sink, log);
  ASSERT_TRUE(runner.Start(&error)) << error;
  runner.Stop();
  EXPECT_NE(log.str().find("frames.yaml: cameras[0].frames: no frame from 127.0.0.1:"), std::string::npos)
      << log.str();
  EXPECT_EQ(log.str().find("hidden-pw"), std::string::npos);
}

}  // namespace
}  // namespace evwatch
