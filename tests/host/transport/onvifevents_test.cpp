// The event-service client against the simulator's device over loopback.

#include "framework/host/onvifevents.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "sim/camstate.h"
#include "sim/makers/onvif_emu.h"
#include "sim/net/httpauth.h"
#include "sim/net/httpserver.h"

namespace {

constexpr char kUser[] = "admin";
constexpr char kPassword[] = "s3cret-Pa55";

class OnvifClientTest : public ::testing::Test {
 protected:
  void StartDevice(evsim::OnvifDeviceOptions options) {
    if (options.user.empty()) {
      options.user = kUser;
      options.password = kPassword;
    }
    device_ = std::make_unique<evsim::OnvifDevice>(options, &state_);
    server_ = std::make_unique<evsim::HttpServer>(
        [this](evsim::HttpConnection& c) { device_->Handle(c); });
    ASSERT_GT(server_->Port(), 0);
  }
  OnvifSettings Settings(const std::string& password = kPassword) const {
    OnvifSettings s;
    s.host = "127.0.0.1";
    s.port = server_->Port();
    s.user = kUser;
    s.password = password;
    s.pull_timeout = 1;
    return s;
  }
  void TearDown() override {
    if (server_) server_->Stop();
  }
  bool BodiesHoldPassword(const std::string& password) const {
    for (const std::string& body : device_->Bodies()) {
      if (body.find(password) != std::string::npos) return true;
    }
    return false;
  }

  evsim::CameraState state_;
  std::unique_ptr<evsim::OnvifDevice> device_;
  std::unique_ptr<evsim::HttpServer> server_;
};

const OnvifEvent* FindEvent(const std::vector<OnvifEvent>& events, OnvifEvent::Topic topic,
                            const std::string& source) {
  for (const OnvifEvent& e : events) {
    if (e.topic == topic && e.source == source) return &e;
  }
  return nullptr;
}

TEST_F(OnvifClientTest, SubscribesAndReceivesInitializedStates) {
  StartDevice({});
  state_.SetMotion(40);
  state_.SetInput(2, true);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  EXPECT_TRUE(client.Subscribed());
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  ASSERT_EQ(events.size(), 3u);
  const OnvifEvent* motion = FindEvent(events, OnvifEvent::Topic::kCellMotion, "VideoSourceConfig_1");
  ASSERT_NE(motion, nullptr);
  EXPECT_TRUE(motion->state);
  EXPECT_TRUE(motion->initialized);
  const OnvifEvent* in1 = FindEvent(events, OnvifEvent::Topic::kDigitalInput, "DigitalInput_1");
  const OnvifEvent* in2 = FindEvent(events, OnvifEvent::Topic::kDigitalInput, "DigitalInput_2");
  ASSERT_NE(in1, nullptr);
  ASSERT_NE(in2, nullptr);
  EXPECT_FALSE(in1->state);
  EXPECT_TRUE(in2->state);
  EXPECT_EQ(device_->Count("GetSystemDateAndTime"), 1);
  EXPECT_EQ(device_->Count("GetCapabilities"), 1);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 1);
  EXPECT_EQ(device_->Count("PullMessages"), 1);
  EXPECT_EQ(device_->Refused(), 0);
  EXPECT_FALSE(BodiesHoldPassword(kPassword));
}

TEST_F(OnvifClientTest, LongPollReturnsWithTheChange) {
  StartDevice({});
  OnvifSettings settings = Settings();
  settings.pull_timeout = 5;
  OnvifEventClient client(settings);
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0);
  events.clear();
  std::thread changer([this] {
    std::this_thread::sleep_for(std::chrono::milliseconds(300));
    state_.SetInput(1, true);
  });
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  changer.join();
  ASSERT_EQ(events.size(), 1u);
  EXPECT_EQ(events[0].topic, OnvifEvent::Topic::kDigitalInput);
  EXPECT_EQ(events[0].source, "DigitalInput_1");
  EXPECT_TRUE(events[0].state);
  EXPECT_FALSE(events[0].initialized);
}

TEST_F(OnvifClientTest, QuietPollSucceedsWithNoMessage) {
  StartDevice({});
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0);
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0);
  events.clear();
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  EXPECT_TRUE(events.empty());
  EXPECT_EQ(device_->Count("PullMessages"), 2);
}

TEST_F(OnvifClientTest, RenewsBeforeTheSubscriptionEnds) {
  StartDevice({});
  OnvifSettings settings = Settings();
  settings.termination = 3;  // the device forgets a subscription 3 s after its last renewal
  OnvifEventClient client(settings);
  ASSERT_EQ(client.Subscribe(), 0);
  std::vector<OnvifEvent> events;
  // Each pull waits about a second; six of them outlive an unrenewed subscription twice.
  for (int i = 0; i < 6; ++i) {
    ASSERT_EQ(client.Pull(events), 0) << "pull " << i << ": " << client.LastError();
  }
  EXPECT_GE(device_->Count("Renew"), 2);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 1);
}

TEST_F(OnvifClientTest, UnsubscribeEndsTheSubscription) {
  StartDevice({});
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0);
  EXPECT_EQ(device_->LiveSubscriptions(), 1);
  client.Unsubscribe();
  EXPECT_FALSE(client.Subscribed());
  EXPECT_EQ(device_->Count("Unsubscribe"), 1);
  EXPECT_EQ(device_->LiveSubscriptions(), 0);
}

TEST_F(OnvifClientTest, InterruptEndsAPollAndKeepsTheSubscription) {
  StartDevice({});
  OnvifSettings settings = Settings();
  settings.pull_timeout = 60;
  OnvifEventClient client(settings);
  ASSERT_EQ(client.Subscribe(), 0);
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0);  // the initial states
  std::thread stopper([&client] {
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    client.Interrupt();
  });
  EXPECT_EQ(client.Pull(events), -1);  // would wait a minute without the interrupt
  stopper.join();
  EXPECT_TRUE(client.Subscribed());
  EXPECT_EQ(client.Pull(events), -1);  // still interrupted
  EXPECT_FALSE(client.WaitInterruptible(60000));
  client.Unsubscribe();
  EXPECT_EQ(device_->Count("Unsubscribe"), 1);
  EXPECT_EQ(device_->LiveSubscriptions(), 0);
  client.ClearInterrupt();
  EXPECT_FALSE(client.Interrupted());
}

TEST_F(OnvifClientTest, DroppedSubscriptionFailsThePullAndCanBeRenewed) {
  StartDevice({});
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0);
  device_->DropSubscriptions();
  std::vector<OnvifEvent> events;
  EXPECT_EQ(client.Pull(events), -1);
  EXPECT_FALSE(client.Subscribed());
  EXPECT_NE(client.LastError().find("PullMessages"), std::string::npos) << client.LastError();
  ASSERT_EQ(client.Subscribe(), 0);
  EXPECT_EQ(client.Pull(events), 0);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 2);
}

TEST_F(OnvifClientTest, WrongPasswordFailsWithoutShowingIt) {
  StartDevice({});
  const std::string wrong = "wr0ng-Pa55word";
  OnvifEventClient client(Settings(wrong));
  EXPECT_EQ(client.Subscribe(), -1);
  EXPECT_FALSE(client.Subscribed());
  EXPECT_NE(client.LastError().find("NotAuthorized"), std::string::npos) << client.LastError();
  EXPECT_EQ(client.LastError().find(wrong), std::string::npos);
  EXPECT_GE(device_->Refused(), 1);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 0);
  EXPECT_FALSE(BodiesHoldPassword(wrong));
}

TEST_F(OnvifClientTest, CameraClockAnHourAheadStillAcceptsTheToken) {
  evsim::OnvifDeviceOptions options;
  options.clock_offset = 3600;
  StartDevice(options);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  EXPECT_NEAR(static_cast<double>(client.ClockOffset()), 3600.0, 5.0);
  std::vector<OnvifEvent> events;
  EXPECT_EQ(client.Pull(events), 0) << client.LastError();
  EXPECT_EQ(device_->Refused(), 0);
}

TEST_F(OnvifClientTest, CameraClockAnHourBehindStillAcceptsTheToken) {
  evsim::OnvifDeviceOptions options;
  options.clock_offset = -3600;
  StartDevice(options);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  EXPECT_NEAR(static_cast<double>(client.ClockOffset()), -3600.0, 5.0);
  EXPECT_EQ(device_->Refused(), 0);
}

TEST_F(OnvifClientTest, EchoesReferenceParametersToTheSubscription) {
  evsim::OnvifDeviceOptions options;
  options.reference_parameters = true;
  StartDevice(options);
  state_.SetInput(2, true);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();  // a second subscription, id 2
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  const OnvifEvent* in2 = FindEvent(events, OnvifEvent::Topic::kDigitalInput, "DigitalInput_2");
  ASSERT_NE(in2, nullptr);
  EXPECT_TRUE(in2->state);
  std::vector<std::string> bodies = device_->Bodies();
  ASSERT_FALSE(bodies.empty());
  EXPECT_NE(bodies.back().find("urn:example:subscription"), std::string::npos);
  EXPECT_NE(bodies.back().find(">2</"), std::string::npos);
  EXPECT_NE(bodies.back().find("/onvif/pullpoint</wsa:To>"), std::string::npos);
  client.Unsubscribe();
  EXPECT_EQ(device_->Count("Unsubscribe"), 1);
  EXPECT_EQ(device_->LiveSubscriptions(), 1);  // the first one, forgotten by the client
}

TEST_F(OnvifClientTest, FindsTheEventServiceThroughGetServices) {
  evsim::OnvifDeviceOptions options;
  options.capabilities = false;
  StartDevice(options);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  EXPECT_EQ(device_->Count("GetServices"), 1);
  EXPECT_EQ(device_->Count("CreatePullPointSubscription"), 1);
}

TEST_F(OnvifClientTest, MatchesNamespacesNotPrefixes) {
  evsim::OnvifDeviceOptions options;
  options.unusual_prefixes = true;
  options.motion_alarm = true;
  StartDevice(options);
  state_.SetMotion(70);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  // Two motion topics and two inputs; the decoys, whose "tns1" is another namespace, are not
  // understood.
  ASSERT_EQ(events.size(), 4u);
  const OnvifEvent* cell = FindEvent(events, OnvifEvent::Topic::kCellMotion, "VideoSourceConfig_1");
  const OnvifEvent* alarm = FindEvent(events, OnvifEvent::Topic::kMotionAlarm, "VideoSource_1");
  ASSERT_NE(cell, nullptr);
  ASSERT_NE(alarm, nullptr);
  EXPECT_TRUE(cell->state);
  EXPECT_TRUE(alarm->state);
  EXPECT_TRUE(cell->initialized);
}

TEST_F(OnvifClientTest, TwoMebibyteAnswerIsRead) {
  evsim::OnvifDeviceOptions options;
  options.padding = "<x:Pad xmlns:x=\"urn:example:pad\">" + std::string(2u << 20, 'p') + "</x:Pad>";
  StartDevice(options);
  state_.SetInput(1, true);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0);
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  const OnvifEvent* in1 = FindEvent(events, OnvifEvent::Topic::kDigitalInput, "DigitalInput_1");
  ASSERT_NE(in1, nullptr);
  EXPECT_TRUE(in1->state);
}

TEST_F(OnvifClientTest, AnswerOverTheBoundFails) {
  evsim::OnvifDeviceOptions options;
  options.padding = "<x:Pad xmlns:x=\"urn:example:pad\">" +
                    std::string(OnvifEventClient::kMaxAnswerBytes + 1, 'p') + "</x:Pad>";
  StartDevice(options);
  OnvifEventClient client(Settings());
  ASSERT_EQ(client.Subscribe(), 0);
  std::vector<OnvifEvent> events;
  EXPECT_EQ(client.Pull(events), -1);
  EXPECT_TRUE(events.empty());
  EXPECT_NE(client.LastError().find("longer than"), std::string::npos) << client.LastError();
}

TEST(OnvifClientHttpAuth, AnswersADigestChallengeBesideTheToken) {
  evsim::CameraState state;
  state.SetInput(1, true);
  evsim::OnvifDeviceOptions options;
  options.user = kUser;
  options.password = kPassword;
  evsim::OnvifDevice device(options, &state);
  evsim::HttpAuth auth(evsim::AuthScheme::kDigest, kUser, kPassword);
  int challenged = 0;
  std::mutex mutex;
  evsim::HttpServer server([&](evsim::HttpConnection& c) {
    if (!auth.Accepts(c.Request())) {
      std::lock_guard<std::mutex> lock(mutex);
      ++challenged;
      c.Write(auth.Challenge());
      return;
    }
    device.Handle(c);
  });
  OnvifSettings s;
  s.host = "127.0.0.1";
  s.port = server.Port();
  s.user = kUser;
  s.password = kPassword;
  s.pull_timeout = 1;
  OnvifEventClient client(s);
  ASSERT_EQ(client.Subscribe(), 0) << client.LastError();
  std::vector<OnvifEvent> events;
  ASSERT_EQ(client.Pull(events), 0) << client.LastError();
  const OnvifEvent* in1 = FindEvent(events, OnvifEvent::Topic::kDigitalInput, "DigitalInput_1");
  ASSERT_NE(in1, nullptr);
  EXPECT_TRUE(in1->state);
  std::lock_guard<std::mutex> lock(mutex);
  EXPECT_GE(challenged, 1);
  server.Stop();
}

TEST(OnvifClientGarbage, GarbageAnswersFailCleanly) {
  const std::vector<std::string> answers = {
      "this is not XML at all <<<>>>",
      "<?xml version=\"1.0\"?><a><b></a>",
      "<?xml version=\"1.0\"?><s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\">"
      "<s:Body><nothing/></s:Body></s:Envelope>",
      std::string("\0\1\2\3garbage", 11),
  };
  for (const std::string& answer : answers) {
    evsim::HttpServer server([&answer](evsim::HttpConnection& c) {
      c.Write(evsim::MakeResponse(200, "application/soap+xml", answer));
    });
    OnvifSettings s;
    s.host = "127.0.0.1";
    s.port = server.Port();
    s.user = kUser;
    s.password = kPassword;
    OnvifEventClient client(s);
    EXPECT_EQ(client.Subscribe(), -1) << answer;
    EXPECT_FALSE(client.Subscribed());
    EXPECT_FALSE(client.LastError().empty());
  }
}

}  // namespace
