// ETROVISIONMD and ETROVISIONEID against a fake camera that pushes text parts at the stream
// the camera API names.

#include "detectors/etrovision.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/eventbuf.h"
#include "tests/support/eventrecorder.h"
#include "tests/support/fakecamera.h"
#include "tests/support/streampush.h"

namespace {

using evtest::EventRecorder;
using evtest::FakeCamera;
using evtest::FollowedAcrossOutage;
using evtest::MotionReading;
using evtest::OutageHandler;
using evtest::Push;
using evtest::PushHandler;
using evtest::RawPart;
using evtest::ReadMotionParts;
using evtest::ReadRawMotionParts;
using evtest::Report;

const char kPath[] = "/cgi-bin/eventstream.cgi?type=all";

CameraAPIRecord StreamAt(int port, const std::string& path = kPath) {
  return evtest::ApiStreamAt(path, port);
}

// ETROVISIONEID's DoEID as a MotionReading: result, active and level.
struct EtroInput {
  ETROVISIONEID& detector;
  int DoMD(MultipartFetch* fetch, bool& active, unsigned int& level) {
    return detector.DoEID(fetch, active, level);
  }
};

class EtrovisionTest : public ::testing::Test {
 protected:
  MotionReading Motion(const std::string& body) {
    ETROVISIONMD detector(&camera_, &api_);
    return ReadMotionParts(cam_, kPath, detector, {body})[0];
  }
  MotionReading Input(const std::string& body, int inputs) {
    ETROVISIONEID detector(&camera_, &api_, inputs);
    EtroInput reader{detector};
    return ReadMotionParts(cam_, kPath, reader, {body})[0];
  }

  // Runs a detector until pred holds of its reports, then stops it.
  std::vector<Report> Run(DetectorBase& detector,
                          const std::function<bool(const std::vector<Report>&)>& pred) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    EXPECT_EQ(detector.Init(&buffer, 500), 0);
    EXPECT_EQ(detector.Start(), 0);
    EXPECT_TRUE(recorder.WaitFor(pred, std::chrono::seconds(20)));
    EXPECT_EQ(detector.Stop(), 0);
    return recorder.Reports();
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
  CameraAPI api_{StreamAt(cam_.Port())};
};

TEST_F(EtrovisionTest, MotionLineIsASixCharacterPrefixInAnyCase) {
  EXPECT_EQ(Motion("md1=on\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("MD1=ON\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("md1=online\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("md2=off\r\nmd1=On\r\n"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Motion("md1=off\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion(" md1=on\r\n"), (MotionReading{0, false, 0}));
  EXPECT_EQ(Motion("md2=on\r\n"), (MotionReading{0, false, 0}));
}

TEST_F(EtrovisionTest, InputsAboveTheLimitAreIgnored) {
  EXPECT_EQ(Input("input2=on\r\n", 1), (MotionReading{0, false, 0}));
  EXPECT_EQ(Input("input1=ON\r\n", 1), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input("input1=off\r\n", 1), (MotionReading{0, false, 0}));
  EXPECT_EQ(Input("input1=off\r\ninput2=on\r\n", 2), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input("Input1=on\r\n", 1), (MotionReading{0, false, 0}))
      << "the prefix test ignores case, the scan does not";
  EXPECT_EQ(Input("input0=on\r\n", 0), (MotionReading{0, true, 100})) << "signed limit";
  EXPECT_EQ(Input("input1=on\r\n", -2), (MotionReading{0, false, 0}));
}

TEST_F(EtrovisionTest, LongInputValueIsCutToTheValueBuffer) {
  EXPECT_EQ(Input("input1=on" + std::string(200, 'x') + "\r\n", 1), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input("input1=" + std::string(120, 'x') + "\r\ninput1=off\r\n", 1),
            (MotionReading{0, false, 0}));
  EXPECT_EQ(Input("input1=" + std::string(31, 'x') + "on\r\n", 1), (MotionReading{0, false, 0}));
}

TEST_F(EtrovisionTest, InputLineEndingBeforeItsNumberEndsTheScan) {
  EXPECT_EQ(Input("input\r\ninput1=on\r\n", 1), (MotionReading{0, false, 0}));
}

TEST_F(EtrovisionTest, PartOf1025BytesIsReadWhole) {
  EXPECT_EQ(Motion(std::string(1025 - 6, '\n') + "md1=on"), (MotionReading{0, true, 100}));
  EXPECT_EQ(Input(std::string(1025 - 9, '\n') + "input1=on", 1), (MotionReading{0, true, 100}));
}

TEST_F(EtrovisionTest, LongPartHeadersAreRead) {
  // A part header of some 300 characters fills the 256-byte header buffer and is cut there.
  const std::string part = RawPart("md1=on\r\n", {"X-Camera-Status: " + std::string(280, 's')});
  ETROVISIONMD detector(&camera_, &api_);
  EXPECT_EQ(ReadRawMotionParts(cam_, kPath, detector, {part, part}),
            (std::vector<MotionReading>{{0, true, 100}, {0, true, 100}}));
}

TEST_F(EtrovisionTest, EtrovisionUsesTheApisPort) {
  cam_.Handle(kPath, PushHandler({Push{{"md1=on\r\ninput1=on\r\n"}, Push::kRepeatLast,
                                       std::chrono::milliseconds(5)}}));
  CameraRecord record = cam_.Record();
  record.port = 1;
  Camera camera(record);
  ETROVISIONMD md(&camera, &api_);
  std::vector<Report> reports = Run(md, [](const std::vector<Report>& r) { return r.size() >= 2; });
  EXPECT_EQ(reports[0], (Report{true, 100}));
  ETROVISIONEID eid(&camera, &api_, 1);
  reports = Run(eid, [](const std::vector<Report>& r) { return r.size() >= 2; });
  EXPECT_EQ(reports[0], (Report{true, 1})) << "validity, not the level";
  EXPECT_EQ(reports.back(), (Report{false, 0}));
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath, kPath}));
}

TEST_F(EtrovisionTest, NoFetcherIsAFailedReading) {
  ETROVISIONEID eid(&camera_, &api_, 1);
  MotionReading r{0, true, 9};
  r.result = eid.DoEID(nullptr, r.motion, r.level);
  EXPECT_EQ(r, (MotionReading{-1, false, 0}));
  ETROVISIONMD md(&camera_, &api_);
  r = MotionReading{0, true, 9};
  r.result = md.DoMD(nullptr, r.motion, r.level);
  EXPECT_EQ(r, (MotionReading{-1, false, 0}));
}

TEST_F(EtrovisionTest, WithoutCameraApiOrStreamTheLoopsEndAtOnceReportingNothing) {
  CameraAPI no_stream{CameraAPIRecord{}};
  std::vector<std::unique_ptr<DetectorBase>> detectors;
  for (CameraAPI* api : {static_cast<CameraAPI*>(nullptr), &no_stream}) {
    detectors.push_back(std::make_unique<ETROVISIONMD>(&camera_, api));
    detectors.push_back(std::make_unique<ETROVISIONEID>(&camera_, api, 1));
  }
  detectors.push_back(std::make_unique<ETROVISIONMD>(nullptr, &api_));
  detectors.push_back(std::make_unique<ETROVISIONEID>(nullptr, &api_, 1));
  for (auto& detector : detectors) {
    EventBuf buffer;
    EventRecorder recorder(buffer);
    ASSERT_EQ(detector->Init(&buffer, 500), 0);
    ASSERT_EQ(detector->Start(), 0);
    ASSERT_EQ(detector->Stop(), 0);
    EXPECT_EQ(recorder.Size(), 0u);
  }
  EXPECT_EQ(cam_.Count(kPath), 0);
}

TEST_F(EtrovisionTest, CameraThatStopsPushingAndComesBackIsFollowedAgain) {
  auto back = [](Report r) {
    return [r](const std::vector<Report>& reports) { return reports.size() > 2 && reports.back() == r; };
  };
  cam_.Handle(kPath, OutageHandler({"md1=on\r\ninput1=on\r\n"}, "md1=on\r\ninput1=on\r\n"));
  ETROVISIONMD md(&camera_, &api_);
  EXPECT_TRUE(FollowedAcrossOutage(Run(md, back(Report{true, 100})), Report{true, 100}, Report{true, 100}));
  cam_.Handle(kPath, OutageHandler({"md1=on\r\ninput1=on\r\n"}, "md1=on\r\ninput1=on\r\n"));
  ETROVISIONEID eid(&camera_, &api_, 1);
  EXPECT_TRUE(FollowedAcrossOutage(Run(eid, back(Report{true, 1})), Report{true, 1}, Report{true, 1}));
}

}  // namespace
