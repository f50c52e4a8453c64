#include "framework/keyvalueanswer.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::FakeCamera;
using evtest::Respond;
using evtest::Text;

const char kPath[] = "/status?x=1";

class KeyValueAnswerTest : public ::testing::Test {
 protected:
  int Get(const std::string& body, const std::string& key, std::string& value,
          ValueForm form = ValueForm::kAsFound) {
    cam_.Answer(kPath, Text(body));
    return GetKeyValueAnswer(&camera_, kPath, cam_.Port(), key, value, form);
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record("user", "pass")};
};

TEST_F(KeyValueAnswerTest, FindsTheKeysValue) {
  std::string value = "old";
  EXPECT_EQ(Get("a=1\nb = two words \r\nc=3\n", "b", value), 0);
  EXPECT_EQ(value, "two words");
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
}

TEST_F(KeyValueAnswerTest, MissingKeyEmptiesTheValue) {
  std::string value = "old";
  EXPECT_EQ(Get("a=1\n", "b", value), -1);
  EXPECT_EQ(value, "");
}

TEST_F(KeyValueAnswerTest, FailedRequestLeavesTheValue) {
  std::string value = "old";
  cam_.Answer(kPath, Respond(500, "text/plain", "b=1\n"));
  EXPECT_EQ(GetKeyValueAnswer(&camera_, kPath, cam_.Port(), "b", value, ValueForm::kAsFound), -1);
  EXPECT_EQ(value, "old");
  EXPECT_EQ(Get("", "b", value), -1) << "an empty answer";
  EXPECT_EQ(value, "old");
  EXPECT_EQ(GetKeyValueAnswer(nullptr, kPath, cam_.Port(), "b", value, ValueForm::kAsFound), -1);
}

TEST_F(KeyValueAnswerTest, AsksTheGivenPortNotTheCameras) {
  FakeCamera other;
  other.Answer("/s", Text("b=9\n"));
  std::string value;
  EXPECT_EQ(GetKeyValueAnswer(&camera_, "s", other.Port(), "b", value, ValueForm::kAsFound), 0);
  EXPECT_EQ(value, "9");
  EXPECT_EQ(other.Targets(), (std::vector<std::string>{"/s"}));
  EXPECT_TRUE(cam_.Targets().empty());
}

TEST_F(KeyValueAnswerTest, OnlyTheFirst8192BytesAreRead) {
  std::string value;
  // The value's line is cut by the end of the read: what came of it is the value.
  const std::string head(8192 - 5, 'x');  // with "\nb=" 8190 bytes: two of the value fit
  EXPECT_EQ(Get(head + "\nb=12345\n", "b", value), 0);
  EXPECT_EQ(value, "12");
  EXPECT_EQ(Get(std::string(8191, 'x') + "\nb=1\n", "b", value), -1);
}

TEST_F(KeyValueAnswerTest, StorageFormDropsOnlyTheFirstSemicolon) {
  std::string value;
  EXPECT_EQ(Get("b=1;\n", "b", value, ValueForm::kFirstSemicolonDropped), 0);
  EXPECT_EQ(value, "1");
  EXPECT_EQ(Get("b=1;2;3\n", "b", value, ValueForm::kFirstSemicolonDropped), 0);
  EXPECT_EQ(value, "12;3");
  EXPECT_EQ(Get("b=1;\n", "b", value, ValueForm::kAsFound), 0);
  EXPECT_EQ(value, "1;");
}

TEST_F(KeyValueAnswerTest, AlarmStatusAsksTheApisPathAndPort) {
  FakeCamera other;
  other.Answer("/alarm?q", Text("Alarm.Status=12\n"));
  CameraAPIRecord record;
  record.stream = StreamLocation{"alarm?q", other.Port()};
  CameraAPI api(record);
  const AlarmStatusForm form = {"Alarm.Status", 2, 1, ValueForm::kAsFound};
  long number = 0;
  EXPECT_EQ(GetAlarmStatus(&camera_, &api, form, number), 0);
  EXPECT_EQ(number, 12);
  EXPECT_EQ(GetAlarmStatus(&camera_, nullptr, form, number), -1);
  EXPECT_EQ(GetAlarmStatus(nullptr, &api, form, number), -1);
  EXPECT_EQ(other.Targets(), (std::vector<std::string>{"/alarm?q"}));
}

}  // namespace
