// The simulator's control API, over real loopback connections.

#include "sim/controlapi.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "sim/simulator.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

using evtest::Exchange;
using evtest::GetRequest;

struct Answer {
  std::string status_line;
  nlohmann::json body;
};

Answer Get(int port, const std::string& target) {
  std::string raw = Exchange(port, GetRequest(target));
  Answer a;
  a.status_line = raw.substr(0, raw.find("\r\n"));
  size_t body = raw.find("\r\n\r\n");
  if (body != std::string::npos) a.body = nlohmann::json::parse(raw.substr(body + 4), nullptr, false);
  return a;
}

TEST(StateChangeTest, ParsesEveryParameter) {
  std::string error;
  auto c = StateChange::Parse("motion=40&input2=1&input8=off&inputs=0&silent=true", &error);
  ASSERT_TRUE(c.has_value()) << error;
  EXPECT_EQ(c->motion, 40);
  EXPECT_EQ(c->all_inputs, false);
  EXPECT_EQ(c->silent, true);
  EXPECT_EQ(c->inputs, (std::vector<std::pair<int, bool>>{{2, true}, {8, false}}));
}

TEST(StateChangeTest, RejectsWhatItDoesNotKnow) {
  for (const char* q : {"", "motion=101", "motion=-1", "motion=x", "input0=1", "input9=1", "input1=2",
                        "silent=maybe", "colour=red", "motion"}) {
    std::string error;
    EXPECT_FALSE(StateChange::Parse(q, &error).has_value()) << q;
    EXPECT_FALSE(error.empty()) << q;
  }
}

TEST(StateChangeTest, AppliesInOrderAllInputsThenSingleOnes) {
  std::string error;
  CameraState s;
  StateChange::Parse("inputs=1&input3=0&motion=5&silent=1", &error)->ApplyTo(s);
  CameraStatus st = s.Get();
  EXPECT_TRUE(st.Input(1));
  EXPECT_FALSE(st.Input(3));
  EXPECT_EQ(st.motion, 5);
  EXPECT_TRUE(st.silent);
}

class ControlApiTest : public ::testing::Test {
 protected:
  void SetUp() override {
    SimOptions options;
    options.emulations = {"canon"};
    options.count = 2;
    std::string error;
    ASSERT_TRUE(sim_.Start(options, &error)) << error;
    port_ = sim_.ControlPort();
    ASSERT_GT(port_, 0);
  }
  Simulator sim_;
  int port_ = 0;
};

TEST_F(ControlApiTest, ListsEveryCamera) {
  Answer a = Get(port_, "/cameras");
  ASSERT_EQ(a.status_line, "HTTP/1.1 200 OK");
  EXPECT_EQ(a.body["control_port"], port_);
  ASSERT_EQ(a.body["cameras"].size(), 2u);
  EXPECT_EQ(a.body["cameras"][0]["name"], "canon1");
  EXPECT_EQ(a.body["cameras"][1]["name"], "canon2");
  EXPECT_EQ(a.body["cameras"][0]["maker"], "Canon");
  EXPECT_EQ(a.body["cameras"][0]["port"], sim_.Cameras()[0].port);
  EXPECT_EQ(a.body["cameras"][0]["classes"], (nlohmann::json{"CanonMD", "CanonEID"}));
  EXPECT_EQ(a.body, nlohmann::json::parse(sim_.Describe().dump()));
}

TEST_F(ControlApiTest, SetsOneCamera) {
  Answer a = Get(port_, "/cameras/canon2/set?motion=60&input4=1");
  ASSERT_EQ(a.status_line, "HTTP/1.1 200 OK");
  EXPECT_EQ(a.body["state"]["motion"], 60);
  EXPECT_EQ(a.body["state"]["inputs"][3], 1);
  EXPECT_EQ(sim_.Find("canon2")->state->Get().motion, 60);
  EXPECT_EQ(sim_.Find("canon1")->state->Get().motion, 0);
  Answer one = Get(port_, "/cameras/canon2");
  EXPECT_EQ(one.body["state"]["motion"], 60);
}

TEST_F(ControlApiTest, SetsAllCameras) {
  Answer a = Get(port_, "/cameras/all/set?inputs=1");
  ASSERT_EQ(a.status_line, "HTTP/1.1 200 OK");
  ASSERT_EQ(a.body.size(), 2u);
  for (const SimCamera& c : sim_.Cameras()) EXPECT_TRUE(c.state->Get().Input(8)) << c.name;
}

TEST_F(ControlApiTest, ErrorsAreAnswered) {
  EXPECT_EQ(Get(port_, "/cameras/canon9").status_line, "HTTP/1.1 404 Not Found");
  EXPECT_EQ(Get(port_, "/cameras/canon9/set?motion=1").status_line, "HTTP/1.1 404 Not Found");
  EXPECT_EQ(Get(port_, "/nothing").status_line, "HTTP/1.1 404 Not Found");
  EXPECT_EQ(Get(port_, "/cameras/canon1/reset").status_line, "HTTP/1.1 404 Not Found");
  Answer bad = Get(port_, "/cameras/canon1/set?motion=500");
  EXPECT_EQ(bad.status_line, "HTTP/1.1 400 Bad Request");
  EXPECT_NE(bad.body["error"].get<std::string>().find("motion=500"), std::string::npos);
  EXPECT_EQ(sim_.Find("canon1")->state->Get().motion, 0);
}

}  // namespace
}  // namespace evsim
