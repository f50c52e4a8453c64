// AxisMD against a fake camera that pushes motion data: readings of single parts (buffer
// sizes, the level and threshold rules, line ends), failed reads, and the stream loop
// (one stream for the whole loop, a report per part, recovery after the camera went away).

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "detectors/axis.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "framework/host/fetcher.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::FetchFrom;
using evtest::MotionReading;
using evtest::Push;
using evtest::PushHandler;
using evtest::ReadMotionParts;
using evtest::Report;

const char kPath[] = "/axis-cgi/motion/motiondata.cgi";

std::string Line(int level, int threshold) {
  return "group=0;level=" + std::to_string(level) + ";threshold=" + std::to_string(threshold) + ";";
}

// A body of exactly `size` bytes: quiet windows and blank lines, then `last` at its very end
// (no line end after it).
std::string Padded(size_t size, const std::string& last) {
  std::string body;
  const std::string quiet = "group=1;level=0;threshold=50;\n";
  while (body.size() + quiet.size() + 1 + last.size() <= size) body += quiet;
  body.append(size - body.size() - last.size(), '\n');
  return body + last;
}

CameraAPIRecord StreamAt(int port, const std::string& path = kPath) {
  return evtest::ApiStreamAt(path, port);
}

class AxisMDTest : public ::testing::Test {
 protected:
  std::vector<MotionReading> Read(const std::vector<std::string>& bodies) {
    AxisMD detector(&camera_, &api_);
    return ReadMotionParts(cam_, kPath, detector, bodies);
  }
  MotionReading ReadOne(const std::string& body) { return Read({body})[0]; }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  CameraAPI api_{StreamAt(cam_.Port())};
};

TEST_F(AxisMDTest, PartOf1024BytesIsReadWhole) {
  const std::string body = Padded(1024, Line(60, 50));
  ASSERT_EQ(body.size(), 1024u);
  EXPECT_EQ(ReadOne(body), (MotionReading{0, true, 60}));
}

TEST_F(AxisMDTest, PartOf1025BytesGoesToAHeapBufferAndItsLastLineIsSeen) {
  const std::string body = Padded(1025, Line(61, 50));
  ASSERT_EQ(body.size(), 1025u);
  EXPECT_EQ(ReadOne(body), (MotionReading{0, true, 61}));
  // A line that begins well past offset 1024 is read too.
  const std::string longer = Padded(2000, Line(62, 50));
  ASSERT_GT(longer.rfind("group=0"), 1024u);
  EXPECT_EQ(ReadOne(longer), (MotionReading{0, true, 62}));
}

TEST_F(AxisMDTest, ShortPartAfterALongOneSeesOnlyItsOwnBytes) {
  std::vector<MotionReading> r =
      Read({Padded(1500, Line(70, 50)), Line(5, 50), Padded(1024, Line(6, 50))});
  EXPECT_EQ(r[0], (MotionReading{0, true, 70}));
  EXPECT_EQ(r[1], (MotionReading{0, false, 5}));
  EXPECT_EQ(r[2], (MotionReading{0, false, 6}));
}

TEST_F(AxisMDTest, LevelEqualToThresholdIsNoMotion) {
  EXPECT_EQ(ReadOne(Line(10, 10)), (MotionReading{0, false, 10}));
}

TEST_F(AxisMDTest, LevelAboveThresholdIsMotionWithThatLevel) {
  EXPECT_EQ(ReadOne(Line(11, 10)), (MotionReading{0, true, 11}));
}

TEST_F(AxisMDTest, NegativeLevelIsHugeUnsignedAndAlwaysMotion) {
  EXPECT_EQ(ReadOne(Line(-1, 10)), (MotionReading{0, true, 4294967295u}));
  EXPECT_EQ(ReadOne(Line(-1, 2147483647)), (MotionReading{0, true, 4294967295u}));
  // The comparison is unsigned on both sides: a negative threshold is beaten by nothing
  // smaller than it.
  EXPECT_EQ(ReadOne(Line(100, -1)), (MotionReading{0, false, 100}));
}

TEST_F(AxisMDTest, WithoutMotionTheLastLinesLevelIsReported) {
  EXPECT_EQ(ReadOne(Line(30, 50) + "\r\n" + Line(5, 50) + "\r\n"), (MotionReading{0, false, 5}));
}

TEST_F(AxisMDTest, FirstLineAboveItsThresholdEndsTheScan) {
  EXPECT_EQ(ReadOne(Line(60, 50) + "\r\n" + Line(90, 50) + "\r\n"), (MotionReading{0, true, 60}));
}

TEST_F(AxisMDTest, LoneCrLosesTheFirstCharacterOfTheNextLine) {
  // "roup=0;..." does not match: level 0 with state false.
  EXPECT_EQ(ReadOne(Line(5, 50) + "\r" + Line(60, 50)), (MotionReading{0, false, 0}));
  EXPECT_EQ(ReadOne(Line(5, 50) + "\r\n" + Line(60, 50)), (MotionReading{0, true, 60}));
  EXPECT_EQ(ReadOne(Line(5, 50) + "\n" + Line(60, 50)), (MotionReading{0, true, 60}));
}

TEST_F(AxisMDTest, BodyWithoutLineEndIsOneLine) {
  EXPECT_EQ(ReadOne(Line(60, 50)), (MotionReading{0, true, 60}));
  EXPECT_EQ(ReadOne(Line(40, 50)), (MotionReading{0, false, 40}));
}

TEST_F(AxisMDTest, LastLineThatDoesNotMatchReportsLevelZero) {
  EXPECT_EQ(ReadOne(Line(30, 50) + "\r\nstatus=ok\r\n"), (MotionReading{0, false, 0}));
}

TEST_F(AxisMDTest, EmptyLinesAreSkipped) {
  EXPECT_EQ(ReadOne(Line(30, 50) + "\n\n\n"), (MotionReading{0, false, 30}));
  EXPECT_EQ(ReadOne("\n\n" + Line(60, 50)), (MotionReading{0, true, 60}));
}

TEST_F(AxisMDTest, LineEndingBeforeItsFirstFieldEndsTheScan) {
  // "group=" runs out before the group: the scan stops there, with level 0.
  EXPECT_EQ(ReadOne(Line(30, 50) + "\ngroup=\n" + Line(60, 50)), (MotionReading{0, false, 0}));
}

TEST_F(AxisMDTest, LineWithoutThresholdComparesWithZero) {
  EXPECT_EQ(ReadOne("group=0;level=30;"), (MotionReading{0, true, 30}));
  EXPECT_EQ(ReadOne("group=0;level=0;"), (MotionReading{0, false, 0}));
}

TEST_F(AxisMDTest, LinesOf128CharactersOrMoreAreCutAndGoOnAsTheNextLine) {
  // The 128th character is given up for the terminator; the rest is the next line.
  EXPECT_EQ(ReadOne(std::string(128, 'x') + Line(60, 50)), (MotionReading{0, true, 60}));
  EXPECT_EQ(ReadOne(std::string(127, 'x') + Line(60, 50)), (MotionReading{0, false, 0}));
}

TEST_F(AxisMDTest, EmptyPartIsNoMotion) { EXPECT_EQ(ReadOne(""), (MotionReading{0, false, 0})); }

TEST_F(AxisMDTest, NegativeLengthIsNoMotionAndLeavesTheLevelAlone) {
  AxisMD detector(&camera_, &api_);
  std::string body = Line(60, 50);
  unsigned int level = 77;
  EXPECT_EQ(detector.IsMotionDetected(&body[0], -1, level), 0);
  EXPECT_EQ(level, 77u);
}

TEST_F(AxisMDTest, NoFetcherOrFailedHeaderReadIsAFailedReading) {
  AxisMD detector(&camera_, &api_);
  bool motion = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(nullptr, motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);

  cam_.Handle(kPath, PushHandler({Push{{}, Push::kClose}}));
  auto fetch = FetchFrom(cam_, kPath);
  motion = true;
  level = 9;
  EXPECT_EQ(detector.DoMD(fetch.get(), motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
}

TEST_F(AxisMDTest, BodyCutShortIsAFailedReading) {
  cam_.Handle(kPath, [](evsim::HttpConnection& c) {
    evtest::MultipartWriter w(c);
    w.Begin();
    w.Raw("--myboundary\r\nContent-Type: text/plain\r\nContent-Length: 100\r\n\r\n" + Line(60, 50));
  });
  AxisMD detector(&camera_, &api_);
  auto fetch = FetchFrom(cam_, kPath);
  bool motion = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(fetch.get(), motion, level), -1);
  EXPECT_FALSE(motion);
  EXPECT_EQ(level, 0u);
}

TEST_F(AxisMDTest, PartBeyondTheLengthCapIsRefusedUnread) {
  const std::string length = std::to_string(MultipartFetch::kMaxPartLength + 1);
  cam_.Handle(kPath, [length](evsim::HttpConnection& c) {
    evtest::MultipartWriter w(c);
    w.Begin();
    w.Raw("--myboundary\r\nContent-Type: text/plain\r\nContent-Length: " + length + "\r\n\r\n" +
          Line(60, 50));
    while (!c.PeerClosed() && c.SleepFor(std::chrono::milliseconds(10))) {
    }
  });
  AxisMD detector(&camera_, &api_);
  auto fetch = FetchFrom(cam_, kPath);
  bool motion = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(fetch.get(), motion, level), -1);
  EXPECT_FALSE(motion);
}

TEST_F(AxisMDTest, LoopReportsEachPartAtOnceOnOneStreamAndEndsWithFalse) {
  cam_.Handle(kPath, PushHandler({Push{{Line(60, 50), Line(5, 50), Line(70, 50)},
                                       Push::kRepeatLast,
                                       std::chrono::milliseconds(5)}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  AxisMD detector(&camera_, &api_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(5));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports[0], (Report{true, 60}));
  EXPECT_EQ(reports[1], (Report{false, 5}));
  EXPECT_EQ(reports[2], (Report{true, 70}));
  EXPECT_EQ(reports[3], (Report{true, 70}));
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

TEST_F(AxisMDTest, LoopTakesPathAndPortFromTheApiAndSendsTheCredentials) {
  const char other[] = "/other/motion.cgi?group=0";
  cam_.RequireAuth(evsim::AuthScheme::kDigest, "root", "secret");
  cam_.Handle(other,
              PushHandler({Push{{Line(60, 50)}, Push::kRepeatLast, std::chrono::milliseconds(5)}}));
  CameraRecord record = cam_.Record("root", "secret");
  record.port = 1;  // the API's port is the one used
  Camera camera(record);
  CameraAPI api(StreamAt(cam_.Port(), other));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  AxisMD detector(&camera, &api);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 60}));
  ASSERT_EQ(detector.Stop(), 0);
  EXPECT_EQ(cam_.Count(other), 2) << "one challenge, one answered request";
}

TEST_F(AxisMDTest, WithoutApiCameraOrStreamTheLoopEndsAtOnceReportingNothing) {
  CameraAPI no_stream{CameraAPIRecord{}};
  AxisMD without_api(&camera_, nullptr);
  AxisMD without_camera(nullptr, &api_);
  AxisMD without_stream(&camera_, &no_stream);
  for (AxisMD* detector : {&without_api, &without_camera, &without_stream}) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    EXPECT_TRUE(detector->IsStarted());
    ASSERT_EQ(detector->Stop(), 0);  // joins the thread: its loop has run and returned
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_EQ(cam_.Count(kPath), 0);
}

TEST_F(AxisMDTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  // First stream: two parts, then the camera goes away; it then refuses one stream and
  // finally pushes again.
  cam_.Handle(kPath,
              PushHandler({Push{{Line(60, 50), Line(61, 50)}, Push::kClose},
                           Push{{}, Push::kClose, {}, "text/plain", 503},
                           Push{{Line(70, 50)}, Push::kRepeatLast, std::chrono::milliseconds(5)}}));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  AxisMD detector(&camera_, &api_);
  ASSERT_EQ(detector.Init(&buffer, 500), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 70}, std::chrono::seconds(20)));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  ASSERT_GE(reports.size(), 4u);
  EXPECT_EQ(reports[0], (Report{true, 60}));
  EXPECT_EQ(reports[1], (Report{true, 61}));
  // While no part can be read, every pass reports (false, 0); then the stream is back.
  size_t back = 2;
  while (back < reports.size() && reports[back] == (Report{false, 0})) ++back;
  EXPECT_GE(back, 3u) << "no (false, 0) while the camera was away";
  ASSERT_LT(back, reports.size());
  EXPECT_EQ(reports[back], (Report{true, 70}));
  EXPECT_GE(cam_.Count(kPath), 3);
}

}  // namespace
