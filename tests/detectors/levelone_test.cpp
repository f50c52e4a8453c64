#include "detectors/levelone.h"

#include <gtest/gtest.h>

#include <memory>
#include <mutex>
#include <random>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::RawConnection;
using evtest::RawTcpServer;
using evtest::Report;
using evtest::Respond;
using evtest::Text;
using Targets = std::vector<std::string>;

const char kSettings[] = "/cgi-bin/admin/param?action=list&group=Motion";
const char kInputs[] = "/io/query_io.cgi";

// A random loopback address, other than 127.0.0.1, for a camera of this test alone.
std::string RandomLoopback() {
  static std::mt19937 random(std::random_device{}());
  std::uniform_int_distribution<int> octet(1, 254);
  return "127." + std::to_string(octet(random)) + "." + std::to_string(octet(random)) + "." +
         std::to_string(octet(random));
}

// The camera's settings CGI and its reading port 19999, both on a loopback address of the
// test's own: the detector's reading port is fixed, so tests that run at once (and a demo
// serving 127.0.0.1:19999) each need their own address.
class LevelOneTest : public ::testing::Test {
 protected:
  void SetUp() override {
    for (int attempt = 0; attempt < 100 && !reading_; ++attempt) {
      const std::string host = RandomLoopback();
      auto server = std::make_unique<RawTcpServer>(
          [this](RawConnection& c) { ServeReading(c); }, host, LevelOneGr2MD::kReadingPort);
      if (server->Port() != LevelOneGr2MD::kReadingPort) continue;
      auto cam = std::make_unique<FakeCamera>(host);
      if (cam->Port() <= 0) continue;
      reading_ = std::move(server);
      cam_ = std::move(cam);
    }
    ASSERT_TRUE(reading_) << "no loopback address with port 19999 free";
    camera_ = std::make_unique<Camera>(cam_->Record("admin", "pw"));
  }

  // What the reading port writes to each connection; empty: it closes without a line.
  void SetReadingLine(const std::string& line) {
    std::lock_guard<std::mutex> lock(mutex_);
    line_ = line;
  }
  void ServeReading(RawConnection& c) {
    std::string line;
    {
      std::lock_guard<std::mutex> lock(mutex_);
      line = line_;
    }
    if (!line.empty()) c.Write(line);
    c.Close();
  }
  void SetSettings(const std::string& body) { cam_->Answer(kSettings, Text(body)); }

  struct Reading {
    int result;
    bool state;
    unsigned int level;
  };
  Reading Motion(const std::string& settings, const std::string& line) {
    SetSettings(settings);
    SetReadingLine(line);
    LevelOneGr2MD detector(camera_.get());
    Reading r{7, true, 77};
    r.result = detector.DoMD(r.state, r.level);
    return r;
  }

  std::mutex mutex_;
  std::string line_;  // guarded by mutex_
  std::unique_ptr<RawTcpServer> reading_;
  std::unique_ptr<FakeCamera> cam_;
  std::unique_ptr<Camera> camera_;
};

TEST_F(LevelOneTest, WindowAboveItsThresholdIsMotionWithTheReadingOverTen) {
  Reading r = Motion("M0.Enabled=yes\r\nM0.Threshold=30\r\n", "R1=45,R2=0,R3=0\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 4u);
  EXPECT_EQ(cam_->Targets(), (Targets{kSettings}));
  EXPECT_EQ(reading_->Connections(), 1);
}

TEST_F(LevelOneTest, ReadingAtOrBelowTheThresholdIsNoMotionButGivesALevel) {
  Reading r = Motion("M0.Enabled=yes\r\nM0.Threshold=30\r\n", "R1=30\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 3u);
}

TEST_F(LevelOneTest, LevelIsCappedAtOneThousandBeforeTheDivision) {
  Reading r = Motion("M0.Enabled=yes\r\nM0.Threshold=30\r\n", "R1=5000\r\n");
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 100u);
}

TEST_F(LevelOneTest, NextWindowIsComparedWithTheDividedLevel) {
  const std::string settings =
      "M0.Enabled=yes\r\nM0.Threshold=100\r\nM1.Enabled=yes\r\nM1.Threshold=100\r\n"
      "M2.Enabled=no\r\n";
  // After window 0 the level is 50; window 1's 60 is larger, so the level becomes 6.
  Reading r = Motion(settings, "R1=500,R2=60,R3=0\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 6u);
  // A later reading below the divided level only divides it again.
  r = Motion(settings, "R1=500,R2=40,R3=0\r\n");
  EXPECT_EQ(r.level, 5u);
}

TEST_F(LevelOneTest, DisabledWindowChangesNeitherStateNorLevel) {
  const std::string settings =
      "M0.Enabled=no\r\nM0.Threshold=0\r\nM1.Enabled=yes\r\nM1.Threshold=50\r\nM2.Enabled=no\r\n";
  Reading r = Motion(settings, "R1=900,R2=20,R3=900\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 2u);
  r = Motion(settings + "M1.Enabled=no\r\n", "R1=900,R2=20,R3=900\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(LevelOneTest, OnlyTheExactNoDisablesAWindow) {
  Reading r = Motion("M0.Enabled=No\r\nM0.Threshold=30\r\n", "R1=45\r\n");
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 4u);
  r = Motion("M0.Enabled=off\r\nM0.Threshold=30\r\n", "R1=45\r\n");
  EXPECT_TRUE(r.state);
  // An Enabled line without a value enables too.
  r = Motion("M0.Enabled\r\nM0.Threshold=30\r\n", "R1=45\r\n");
  EXPECT_TRUE(r.state);
  // A window the settings do not mention stays off: the records are cleared.
  r = Motion("M0.Threshold=30\r\n", "R1=45\r\n");
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
}

TEST_F(LevelOneTest, SettingsAreReadIntoTheWindowsAndClearedAtEveryRead) {
  LevelOneGr2MD detector(camera_.get());
  SetSettings(
      "M0.Enabled=yes\r\nM0.Sensitivity=70\r\nM0.Threshold=30\r\nM0.Left=1\r\nM0.Top=2\r\n"
      "M0.Right=300\r\nM0.Bottom=200\r\nM2.Enabled=yes\r\nM2.Threshold=-1\r\n");
  ASSERT_EQ(detector.GetMotionWin(), 0);
  const LevelOneGr2MD::MotionWindow& w0 = detector.Window(0);
  EXPECT_TRUE(w0.enabled);
  EXPECT_EQ(w0.sensitivity, 70);
  EXPECT_EQ(w0.threshold, 30u);
  EXPECT_EQ(w0.left, 1);
  EXPECT_EQ(w0.top, 2);
  EXPECT_EQ(w0.right, 300);
  EXPECT_EQ(w0.bottom, 200);
  EXPECT_FALSE(detector.Window(1).enabled);
  EXPECT_TRUE(detector.Window(2).enabled);
  EXPECT_EQ(detector.Window(2).threshold, static_cast<unsigned int>(-1));

  SetSettings("M1.Enabled=yes\r\nM1.Top=9\r\n");
  ASSERT_EQ(detector.GetMotionWin(), 0);
  EXPECT_FALSE(detector.Window(0).enabled);
  EXPECT_EQ(detector.Window(0).threshold, 0u);
  EXPECT_EQ(detector.Window(0).right, 0);
  EXPECT_TRUE(detector.Window(1).enabled);
  EXPECT_EQ(detector.Window(1).top, 9);
  EXPECT_FALSE(detector.Window(2).enabled);
  EXPECT_EQ(cam_->Targets(), (Targets{kSettings, kSettings}));
  EXPECT_EQ(reading_->Connections(), 0);
}

TEST_F(LevelOneTest, WindowNames) {
  LevelOneGr2MD detector(camera_.get());
  // M0 is recognised as a prefix, M1 and M2 only exactly; names are case-sensitive.
  SetSettings("M0x.Threshold=5\r\nM1x.Enabled=yes\r\nM10.Enabled=yes\r\nm2.Enabled=yes\r\n");
  ASSERT_EQ(detector.GetMotionWin(), 0);
  EXPECT_EQ(detector.Window(0).threshold, 5u);
  EXPECT_FALSE(detector.Window(1).enabled);
  EXPECT_FALSE(detector.Window(2).enabled);
  // Reading stops at the first empty line.
  SetSettings("M0.Enabled=yes\r\n\r\nM1.Enabled=yes\r\n");
  ASSERT_EQ(detector.GetMotionWin(), 0);
  EXPECT_TRUE(detector.Window(0).enabled);
  EXPECT_FALSE(detector.Window(1).enabled);
}

TEST_F(LevelOneTest, SettingsAreReadWhateverTheirContentType) {
  cam_->Answer(kSettings, evtest::Raw("HTTP/1.1 200 OK\r\nContent-Length: 33\r\nConnection: close\r\n\r\n"
                                      "M0.Enabled=yes\r\nM0.Threshold=30\r\n"));
  SetReadingLine("R1=45\r\n");
  LevelOneGr2MD detector(camera_.get());
  bool state = false;
  unsigned int level = 0;
  EXPECT_EQ(detector.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(level, 4u);
  cam_->Answer(kSettings, Respond(200, "application/octet-stream", "M0.Threshold=10\r\nM0.Enabled=yes\r\n"));
  EXPECT_EQ(detector.DoMD(state, level), 0);
  EXPECT_TRUE(state);
}

TEST_F(LevelOneTest, ReadingLine) {
  const std::string all = "M0.Enabled=yes\r\nM1.Enabled=yes\r\nM2.Enabled=yes\r\n"
                          "M0.Threshold=1000\r\nM1.Threshold=1000\r\nM2.Threshold=10\r\n";
  // All three readings are read; window 2's 70 over its threshold 10 is motion.
  Reading r = Motion(all, "R1=0,R2=0,R3=70\r\n");
  EXPECT_TRUE(r.state);
  EXPECT_EQ(r.level, 7u);
  // In any order.
  r = Motion(all, "R3=70,R1=0\r\n");
  EXPECT_TRUE(r.state);
  // A name after a blank is not seen: after a value only "." and "=" part the names.
  r = Motion(all, "R1=0, R3=70\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  // Names are case-sensitive; a line of other names reads nothing.
  r = Motion(all, "r3=70\r\n");
  EXPECT_FALSE(r.state);
  r = Motion(all, "hello\r\n");
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
}

TEST_F(LevelOneTest, FailedSettingsRequestFailsThePollWithoutConnecting) {
  cam_->Answer(kSettings, Respond(404, "text/plain", ""));
  SetReadingLine("R1=45\r\n");
  LevelOneGr2MD detector(camera_.get());
  bool state = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  EXPECT_EQ(reading_->Connections(), 0);
}

TEST_F(LevelOneTest, ReadingPortClosedWithoutALineFailsThePoll) {
  Reading r = Motion("M0.Enabled=yes\r\n", "");
  EXPECT_EQ(r.result, -1);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(r.level, 0u);
  EXPECT_EQ(reading_->Connections(), 1);
}

TEST_F(LevelOneTest, NothingListeningOnTheReadingPortFailsThePoll) {
  // A camera on another address, where port 19999 is not served.
  std::unique_ptr<FakeCamera> other;
  for (int attempt = 0; attempt < 100 && !other; ++attempt) {
    auto cam = std::make_unique<FakeCamera>(RandomLoopback());
    if (cam->Port() > 0) other = std::move(cam);
  }
  ASSERT_TRUE(other);
  other->Answer(kSettings, Text("M0.Enabled=yes\r\n"));
  Camera camera(other->Record());
  LevelOneGr2MD detector(&camera);
  bool state = true;
  unsigned int level = 9;
  EXPECT_EQ(detector.DoMD(state, level), -1);
  EXPECT_FALSE(state);
  EXPECT_EQ(other->Targets(), (Targets{kSettings}));
}

TEST_F(LevelOneTest, MotionLoopAsksSettingsAndReadingEachPass) {
  SetSettings("M0.Enabled=yes\r\nM0.Threshold=30\r\n");
  SetReadingLine("R1=450\r\n");
  EventBuf buffer;
  EventRecorder recorder(buffer);
  LevelOneGr2MD detector(camera_.get());
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 45}));
  SetReadingLine("");
  ASSERT_TRUE(recorder.WaitFor([](const std::vector<Report>& r) { return r.back() == Report{false, 0}; }));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  for (const Report& r : reports) EXPECT_TRUE(r == (Report{true, 45}) || r == (Report{false, 0}));
  // One settings request and one connection per pass; the final report has neither.
  EXPECT_EQ(cam_->Targets(), Targets(reports.size() - 1, kSettings));
  EXPECT_EQ(static_cast<size_t>(reading_->Connections()), reports.size() - 1);
}

TEST_F(LevelOneTest, NullCameraFailsEveryMotionPass) {
  LevelOneGr2MD detector(nullptr);
  EXPECT_EQ(detector.GetMotionWin(), -1);
  EventBuf buffer;
  EventRecorder recorder(buffer);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  for (const Report& r : recorder.Reports()) EXPECT_EQ(r, (Report{false, 0}));
}

class LevelOneInputTest : public ::testing::Test {
 protected:
  struct Reading {
    int result;
    bool state;
  };
  Reading Read(int inputs, bool preset = false) {
    LevelOneGr1EID detector(&camera_, inputs);
    Reading r{7, preset};
    r.result = detector.DoEID(r.state);
    return r;
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("admin", "pw")};
};

TEST_F(LevelOneInputTest, ReadingIsThatOfTheLastInput) {
  cam_.Answer(kInputs, Text("input_1=1\r\ninput_2=0\r\n"));
  Reading r = Read(2);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  // Every input is asked every pass, even after an active one.
  EXPECT_EQ(cam_.Targets(), (Targets{kInputs, kInputs}));
  cam_.ClearLog();
  cam_.Answer(kInputs, Text("input_1=0\r\ninput_2=1\r\n"));
  r = Read(2);
  EXPECT_TRUE(r.state);
  EXPECT_EQ(cam_.Targets(), (Targets{kInputs, kInputs}));
  r = Read(1);
  EXPECT_FALSE(r.state);
}

TEST_F(LevelOneInputTest, KeyAndValueArePrefixes) {
  cam_.Answer(kInputs, Text("input_10=1\r\n"));
  EXPECT_TRUE(Read(1).state);
  cam_.Answer(kInputs, Text("INPUT_1=1st\r\n"));
  EXPECT_TRUE(Read(1).state);
  cam_.Answer(kInputs, Text("input_1=0\r\n"));
  EXPECT_FALSE(Read(1, true).state);
}

TEST_F(LevelOneInputTest, FailedRequestReadsInactiveAndIsValid) {
  cam_.AnswerSequence(kInputs, {Text("input_1=1\r\n"), Respond(500, "text/plain", "input_2=1\r\n")});
  Reading r = Read(2, true);
  EXPECT_EQ(r.result, 0);
  EXPECT_FALSE(r.state);
  EXPECT_EQ(cam_.Targets(), (Targets{kInputs, kInputs}));
}

TEST_F(LevelOneInputTest, InputCountBelowOneAsksNothing) {
  for (int inputs : {0, -1, -4}) {
    Reading r = Read(inputs, false);
    EXPECT_EQ(r.result, 0) << inputs;
    EXPECT_FALSE(r.state) << inputs;
  }
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(LevelOneInputTest, LoopReportsValidReadingsEvenWhenTheCameraFails) {
  cam_.Answer(kInputs, Text("input_1=1\r\n"));
  EventBuf buffer;
  EventRecorder recorder(buffer);
  LevelOneGr1EID detector(&camera_, 1);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForReport(Report{true, 1}));
  cam_.Answer(kInputs, Respond(404, "text/plain", ""));
  ASSERT_TRUE(recorder.WaitForReport(Report{false, 1}));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i].value, 1) << i;
}

TEST_F(LevelOneInputTest, NullCameraReadsInactiveEveryPass) {
  EventBuf buffer;
  EventRecorder recorder(buffer);
  LevelOneGr1EID detector(nullptr, 2);
  ASSERT_EQ(detector.Init(&buffer, 20), 0);
  ASSERT_EQ(detector.Start(), 0);
  ASSERT_TRUE(recorder.WaitForCount(2));
  ASSERT_EQ(detector.Stop(), 0);
  std::vector<Report> reports = recorder.Reports();
  for (size_t i = 0; i + 1 < reports.size(); ++i) EXPECT_EQ(reports[i], (Report{false, 1})) << i;
  EXPECT_EQ(reports.back(), (Report{false, 0}));
}

}  // namespace
