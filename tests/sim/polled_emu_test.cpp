// The emulations of the cameras whose detectors ask one CGI per pass (Vivotek and JVC
// inputs, Messoa, LevelOne), read by those detectors themselves and by raw requests.

#include <gtest/gtest.h>

#include <set>
#include <string>

#include "detectors/jvc.h"
#include "detectors/levelone.h"
#include "detectors/messoa.h"
#include "detectors/vivotek.h"
#include "framework/host/camera.h"
#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

class PolledEmulationTest : public ::testing::Test {
 protected:
  void Start(const std::string& key, SimOptions options = {}) {
    options.emulations = {key};
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    cam_ = &sim_.Cameras().at(0);
  }
  Camera MakeCamera(const SimCamera& cam) {
    CameraRecord r;
    r.host = cam.host.empty() ? "127.0.0.1" : cam.host;
    r.port = cam.port;
    return Camera(r);
  }
  Simulator sim_;
  const SimCamera* cam_ = nullptr;
};

TEST_F(PolledEmulationTest, VivotekInputCgisOfBothFamilies) {
  Start("vivotek");
  cam_->state->SetInput(2, true);
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/getdi.cgi?di2"));
  EXPECT_NE(raw.find("\r\n\r\nDI2=H\r\n"), std::string::npos) << raw;
  raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/dido/getdi.cgi?di0"));
  EXPECT_NE(raw.find("\r\n\r\ndi0=0\r\n"), std::string::npos) << raw;
  raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/getdi.cgi?di9"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 400", 0), 0u) << raw;

  Camera camera = MakeCamera(*cam_);
  for (int group : {0, 1, 2, 3}) {
    VivotekEID eid(&camera, static_cast<VIVO_FUNC_GR>(group), 2);
    bool active = false;
    ASSERT_EQ(eid.DoEID(active), 0) << group;
    EXPECT_TRUE(active) << group;
  }
  cam_->state->SetAllInputs(false);
  VivotekEID eid(&camera, static_cast<VIVO_FUNC_GR>(2), 2);
  bool active = true;
  ASSERT_EQ(eid.DoEID(active), 0);
  EXPECT_FALSE(active);
}

TEST_F(PolledEmulationTest, JvcInputPins) {
  Start("jvc");
  Camera camera = MakeCamera(*cam_);
  JVCEID eid(&camera, 2);
  bool active = true;
  ASSERT_EQ(eid.DoEID(active), 0);
  EXPECT_FALSE(active);
  cam_->state->SetInput(2, true);
  ASSERT_EQ(eid.DoEID(active), 0);
  EXPECT_TRUE(active);
  std::string raw =
      evtest::Exchange(cam_->port, evtest::GetRequest("/api/param?peripheral.input_pin.pin(2).status"));
  EXPECT_NE(raw.find("\r\n\r\nperipheral.input_pin.pin(2).status=make&200\r\n"), std::string::npos) << raw;
  raw = evtest::Exchange(cam_->port, evtest::GetRequest("/api/param?peripheral.output_pin.pin(1).status"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 400", 0), 0u) << raw;
}

TEST_F(PolledEmulationTest, MessoaModeCodes) {
  Start("messoa");
  Camera camera = MakeCamera(*cam_);
  MessoaMD md(&camera);
  MessoaEID eid(&camera, 1);
  struct Case {
    int motion;
    bool input;
    const char* mode;
  };
  for (const Case& c : {Case{0, false, "Mode=0"}, Case{0, true, "Mode=1"}, Case{40, false, "Mode=2"},
                        Case{40, true, "Mode=3"}}) {
    cam_->state->SetMotion(c.motion);
    cam_->state->SetInput(1, c.input);
    std::string raw = evtest::Exchange(
        cam_->port, evtest::GetRequest("/cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus"));
    EXPECT_NE(raw.find(std::string("\r\n\r\n[AlarmStatus]\r\n") + c.mode + "\r\n"), std::string::npos) << raw;
    bool state = !c.motion;
    unsigned int level = 7;
    ASSERT_EQ(md.DoMD(state, level), 0) << c.mode;
    EXPECT_EQ(state, c.motion > 0) << c.mode;
    EXPECT_EQ(level, c.motion > 0 ? 100u : 0u) << c.mode;
    bool active = !c.input;
    ASSERT_EQ(eid.DoEID(active), 0) << c.mode;
    EXPECT_EQ(active, c.input) << c.mode;
  }
}

TEST_F(PolledEmulationTest, LevelOneServesItsReadingPortOnAnAddressOfItsOwn) {
  SimOptions options;
  options.fixed_port_host = "auto";
  Start("levelone", options);
  ASSERT_FALSE(cam_->host.empty());
  EXPECT_EQ(cam_->tcp_port, LevelOneGr2MD::kReadingPort);
  Camera camera = MakeCamera(*cam_);
  LevelOneGr2MD md(&camera);
  bool state = true;
  unsigned int level = 7;
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_FALSE(state);
  EXPECT_EQ(level, 0u);
  cam_->state->SetMotion(55);
  ASSERT_EQ(md.DoMD(state, level), 0);
  EXPECT_TRUE(state);
  EXPECT_EQ(level, 55u);

  LevelOneGr1EID eid(&camera, 1);
  bool active = true;
  ASSERT_EQ(eid.DoEID(active), 0);
  EXPECT_FALSE(active);
  cam_->state->SetInput(1, true);
  ASSERT_EQ(eid.DoEID(active), 0);
  EXPECT_TRUE(active);
  // Two polls of the motion detector: two settings requests and two connections; two of
  // the input detector.
  EXPECT_EQ(cam_->state->Requests(), 6u);
}

TEST_F(PolledEmulationTest, LevelOneCamerasEachGetTheirOwnAddress) {
  SimOptions options;
  options.fixed_port_host = "auto";
  options.count = 3;
  options.emulations = {"levelone"};
  std::string error;
  ASSERT_TRUE(sim_.Start(options, &error)) << error;
  std::set<std::string> hosts;
  for (const SimCamera& c : sim_.Cameras()) hosts.insert(c.host);
  EXPECT_EQ(hosts.size(), 3u);
  EXPECT_EQ(hosts.count(""), 0u);
  // Each describes its address, for clients to find it.
  const nlohmann::json described = sim_.Describe();
  for (const auto& c : described["cameras"]) EXPECT_TRUE(c.contains("host")) << c.dump();

  // Another simulator cannot take an address already held.
  Simulator other;
  SimOptions taken;
  taken.emulations = {"levelone"};
  taken.fixed_port_host = sim_.Cameras().at(0).host;
  EXPECT_FALSE(other.Start(taken, &error));
  EXPECT_NE(error.find("19999"), std::string::npos) << error;
}

TEST_F(PolledEmulationTest, LevelOneWithoutAFixedPortHostServesHttpOnly) {
  Start("levelone");
  EXPECT_TRUE(cam_->host.empty());
  EXPECT_EQ(cam_->tcp_port, 0);
  EXPECT_FALSE(sim_.Describe()["cameras"][0].contains("host"));
  cam_->state->SetInput(1, true);
  std::string raw = evtest::Exchange(cam_->port, evtest::GetRequest("/io/query_io.cgi"));
  EXPECT_NE(raw.find("\r\n\r\ninput_1=1\r\ninput_2=0\r\n"), std::string::npos) << raw;
  raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/admin/param?action=list&group=Motion"));
  EXPECT_NE(raw.find("M0.Enabled=yes\r\n"), std::string::npos) << raw;
  raw = evtest::Exchange(cam_->port, evtest::GetRequest("/cgi-bin/admin/param?action=list&group=Network"));
  EXPECT_EQ(raw.rfind("HTTP/1.1 400", 0), 0u) << raw;
}

}  // namespace
}  // namespace evsim
