#include "framework/httpreq.h"

#include <gtest/gtest.h>

#include "framework/host/camera.h"
#include "framework/host/httpclient.h"
#include "tests/support/fakecamera.h"

namespace {

using evtest::FakeCamera;
using evtest::Respond;
using evtest::Text;

const char kPath[] = "/cgi-bin/io?x=1";

std::string Lines(int count, const std::string& filler = "other=0") {
  std::string body;
  for (int i = 0; i < count; ++i) body += filler + "\r\n";
  return body;
}

class HttpReqTest : public ::testing::Test {
 protected:
  int Check(const std::string& key, const std::string& value) {
    return SendHttpReqAndCheckResp(&camera_, kPath, key, value);
  }
  int Get(const std::string& key, std::string& value) {
    return SendHttpReqAndGetResp(&camera_, kPath, key, value);
  }

  FakeCamera cam_;
  Camera camera_{cam_.Record()};
};

TEST_F(HttpReqTest, CheckMatchesKeyAndValueByPrefix) {
  cam_.Answer(kPath, Text("input1=1\r\n"));
  EXPECT_EQ(Check("input", "1"), 1);
  EXPECT_EQ(cam_.Targets(), (std::vector<std::string>{kPath}));
  EXPECT_EQ(cam_.Requests()[0].method, "GET");
}

TEST_F(HttpReqTest, CheckComparesWithoutRegardToCase) {
  cam_.Answer(kPath, Text("INPUT1=ACTIVE\r\n"));
  EXPECT_EQ(Check("input1", "active"), 1);
}

TEST_F(HttpReqTest, CheckTakesTheValueTokenAtTheNextBlank) {
  // After the key, only blanks delimit: in "key = value" the value token is "=".
  cam_.Answer(kPath, Text("input1 = active\r\n"));
  EXPECT_EQ(Check("input1", "active"), 0);
  EXPECT_EQ(Check("input1", "="), 1);
}

TEST_F(HttpReqTest, CheckValueMustBeginWithTheValue) {
  cam_.Answer(kPath, Text("input1=inactive\r\n"));
  EXPECT_EQ(Check("input1", "active"), 0);
}

TEST_F(HttpReqTest, CheckNeverSeesAnEleventhLine) {
  cam_.Answer(kPath, Text(Lines(10) + "input1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 0);
  cam_.Answer(kPath, Text(Lines(9) + "input1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 1);
}

TEST_F(HttpReqTest, CheckStopsAtAnEmptyLine) {
  cam_.Answer(kPath, Text("a=0\r\n\r\ninput1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 0);
}

TEST_F(HttpReqTest, CheckKeepsAMatchWhenReadingGoesOn) {
  cam_.Answer(kPath, Text("input1=1\r\ninput1=0\r\n::\r\n"));
  EXPECT_EQ(Check("input1", "1"), 1);
}

TEST_F(HttpReqTest, CheckFailsOnNonTextAnswer) {
  cam_.Answer(kPath, Respond(200, "application/json", "input1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 0);
}

TEST_F(HttpReqTest, CheckAcceptsAnyTextType) {
  cam_.Answer(kPath, Respond(200, "text/html; charset=utf-8", "input1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 1);
}

TEST_F(HttpReqTest, CheckFailsOnHttpError) {
  cam_.Answer(kPath, Respond(404, "text/plain", "input1=1\r\n"));
  EXPECT_EQ(Check("input1", "1"), 0);
  EXPECT_EQ(SendHttpReqAndCheckResp(nullptr, kPath, "input1", "1"), 0);
}

TEST_F(HttpReqTest, GetLeavesValueUntouchedWhenKeyIsMissing) {
  cam_.Answer(kPath, Text("a=1\r\nb=2\r\n\r\n"));
  std::string value = "unchanged";
  EXPECT_EQ(Get("PORT_CONTROL", value), 0);
  EXPECT_EQ(value, "unchanged");
}

TEST_F(HttpReqTest, GetFailsWhenBodyEndsEarlyEvenAfterAMatch) {
  cam_.Answer(kPath, Text("PORT_CONTROL=6002\r\n"));  // no empty line, fewer than 10 lines
  std::string value = "unchanged";
  EXPECT_EQ(Get("PORT_CONTROL", value), -1);
}

TEST_F(HttpReqTest, GetSucceedsAtTheTenthLine) {
  cam_.Answer(kPath, Text("PORT_CONTROL=6002\r\n" + Lines(9)));
  std::string value;
  EXPECT_EQ(Get("PORT_CONTROL", value), 0);
  EXPECT_EQ(value, "6002");
}

TEST_F(HttpReqTest, GetDropsApostrophesAndKeepsTheFirstWord) {
  cam_.Answer(kPath, Text("DIO_STATUS='1f'\r\nNAME='front door'\r\n\r\n"));
  std::string value;
  EXPECT_EQ(Get("DIO_STATUS", value), 0);
  EXPECT_EQ(value, "1f");
  EXPECT_EQ(Get("NAME", value), 0);
  EXPECT_EQ(value, "front");
}

TEST_F(HttpReqTest, GetLaterMatchOverwrites) {
  cam_.Answer(kPath, Text("K=1\r\nK=2\r\n\r\n"));
  std::string value;
  EXPECT_EQ(Get("K", value), 0);
  EXPECT_EQ(value, "2");
}

TEST_F(HttpReqTest, GetFailsOnKeyWithoutValueAndOnLineWithoutToken) {
  std::string value = "unchanged";
  cam_.Answer(kPath, Text("K=\r\n\r\n"));
  EXPECT_EQ(Get("K", value), -1);
  cam_.Answer(kPath, Text(" : \r\n\r\n"));
  EXPECT_EQ(Get("K", value), -1);
  EXPECT_EQ(value, "unchanged");
}

TEST_F(HttpReqTest, GetFailsOnNullCameraAndWrongType) {
  std::string value = "unchanged";
  EXPECT_EQ(SendHttpReqAndGetResp(nullptr, kPath, "K", value), -1);
  cam_.Answer(kPath, Respond(200, "image/jpeg", "K=1\r\n\r\n"));
  EXPECT_EQ(Get("K", value), -1);
  EXPECT_EQ(value, "unchanged");
}

TEST_F(HttpReqTest, CgiRequestContentTypeTests) {
  cam_.Answer(kPath, Respond(200, "TEXT/PLAIN; charset=x", "x"));
  {
    CgiRequest request(&camera_, kPath, 10, 4096);
    ASSERT_TRUE(request.Ok());
    EXPECT_TRUE(request.ContentTypeIs("text/plain"));
    EXPECT_TRUE(request.ContentTypeIs("text"));
  }
  cam_.Answer(kPath, Respond(200, "text/html", "x"));
  {
    CgiRequest request(&camera_, kPath, 10, 4096);
    ASSERT_TRUE(request.Ok());
    EXPECT_FALSE(request.ContentTypeIs("text/plain"));
    EXPECT_TRUE(request.ContentTypeIs("text"));
  }
  cam_.Answer(kPath, Respond(200, " ;=", "x"));  // a Content-Type without a token
  {
    CgiRequest request(&camera_, kPath, 10, 4096);
    EXPECT_FALSE(request.Ok());
  }
}

TEST_F(HttpReqTest, ModuleScanCountsEmptyLinesAndStopsAtMatch) {
  cam_.Answer(kPath, Text("\r\n\r\ninput1=active\r\n"));
  CgiRequest request(&camera_, kPath, 10);
  ASSERT_TRUE(request.Ok());
  EXPECT_TRUE(MatchKeyValueLines(request.Client(), "input1", "active", LineScan::kModule));
  cam_.Answer(kPath, Text(Lines(9, "") + "\r\ninput1=active\r\n"));
  CgiRequest second(&camera_, kPath, 10);
  ASSERT_TRUE(second.Ok());
  EXPECT_FALSE(MatchKeyValueLines(second.Client(), "input1", "active", LineScan::kModule));
}

}  // namespace
