// The simulator's RTSP session as a client sees it on the wire: answers and their CSeq, the
// transports and tracks it sets up, authentication, the interleaved packets after PLAY, and
// the end of a session that its client leaves silent.

#include "sim/net/rtspserver.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "sim/net/tcpserver.h"
#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

using evtest::LoopbackClient;

class RtspServerTest : public ::testing::Test {
 protected:
  void Serve(RtspStream stream) {
    stream_ = std::move(stream);
    server_ = std::make_unique<TcpServer>(
        [this](TcpConnection& connection) { ServeRtspSession(connection, stream_); });
    ASSERT_GT(server_->Port(), 0);
    client_ = std::make_unique<LoopbackClient>(server_->Port());
    ASSERT_TRUE(client_->Connected());
  }

  std::string Url(const std::string& suffix = "") const {
    return "rtsp://127.0.0.1:" + std::to_string(server_->Port()) + "/live.sdp" + suffix;
  }

  // Sends a request and reads its answer head (and anything that came after it).
  std::string Ask(const std::string& method, const std::string& url, int cseq,
                  const std::string& headers = "") {
    EXPECT_TRUE(client_->Send(method + " " + url + " RTSP/1.0\r\nCSeq: " + std::to_string(cseq) +
                              "\r\n" + headers + "\r\n"));
    return client_->ReadUntil("\r\n\r\n");
  }

  // Reads on until text holds marker, which may span two reads; false after 10 s without it.
  bool ReadOnUntil(std::string& text, const std::string& marker) {
    for (int i = 0; i < 50 && text.find(marker) == std::string::npos; ++i) {
      text += client_->ReadUntil(marker, std::chrono::milliseconds(200));
    }
    return text.find(marker) != std::string::npos;
  }

  RtspStream stream_;
  std::unique_ptr<TcpServer> server_;
  std::unique_ptr<LoopbackClient> client_;
};

TEST_F(RtspServerTest, AnswersCarryTheCSeqAndDescribeListsBothTracks) {
  Serve(RtspStream());
  std::string answer = Ask("OPTIONS", Url(), 7);
  EXPECT_EQ(answer.rfind("RTSP/1.0 200 OK\r\nCSeq: 7\r\n", 0), 0u) << answer;
  EXPECT_NE(answer.find("GET_PARAMETER"), std::string::npos);
  answer = Ask("DESCRIBE", Url(), 8);
  EXPECT_EQ(answer.rfind("RTSP/1.0 200 OK\r\nCSeq: 8\r\n", 0), 0u) << answer;
  EXPECT_NE(answer.find("Content-Base: " + Url("/") + "\r\n"), std::string::npos) << answer;
  // The body may still be on its way; read up to the video track's control line.
  ASSERT_TRUE(ReadOnUntil(answer, "a=control:trackID=1\r\n")) << answer;
  EXPECT_NE(answer.find("m=audio"), std::string::npos);
  EXPECT_LT(answer.find("m=audio"), answer.find("m=video"));
  answer = Ask("PAUSE", Url(), 9);
  EXPECT_EQ(answer.rfind("RTSP/1.0 405 ", 0), 0u) << answer;
}

TEST_F(RtspServerTest, SetsUpOnlyTheVideoTrackInterleaved) {
  Serve(RtspStream());
  const std::string tcp = "Transport: RTP/AVP/TCP;unicast;interleaved=0-1\r\n";
  std::string answer = Ask("SETUP", Url("/trackID=2"), 1, tcp);
  EXPECT_EQ(answer.rfind("RTSP/1.0 461 ", 0), 0u) << "the audio track: " << answer;
  answer = Ask("SETUP", Url("/trackID=1"), 2,
               "Transport: RTP/AVP;unicast;client_port=5000-5001\r\n");
  EXPECT_EQ(answer.rfind("RTSP/1.0 461 ", 0), 0u) << "over UDP: " << answer;
  answer = Ask("PLAY", Url("/"), 3, "Session: 5A1B2C3D\r\n");
  EXPECT_EQ(answer.rfind("RTSP/1.0 454 ", 0), 0u) << "nothing set up yet: " << answer;
  answer = Ask("SETUP", Url("/trackID=1"), 4, tcp);
  EXPECT_EQ(answer.rfind("RTSP/1.0 200 OK\r\nCSeq: 4\r\n", 0), 0u) << answer;
  EXPECT_NE(answer.find("Session: 5A1B2C3D;timeout=60\r\n"), std::string::npos) << answer;
  EXPECT_NE(answer.find("interleaved=0-1"), std::string::npos) << answer;
}

TEST_F(RtspServerTest, PlaySendsInterleavedRtpPacketsWithTheExtension) {
  RtspStream stream;
  stream.period = std::chrono::milliseconds(5);
  stream.extension = [](uint64_t n) {
    return std::optional<std::string>("e" + std::to_string(n));
  };
  Serve(stream);
  Ask("SETUP", Url("/trackID=1"), 1, "Transport: RTP/AVP/TCP;unicast;interleaved=0-1\r\n");
  std::string answer = Ask("PLAY", Url("/"), 2, "Session: 5A1B2C3D\r\n");
  ASSERT_EQ(answer.rfind("RTSP/1.0 200 OK\r\nCSeq: 2\r\n", 0), 0u) << answer;
  const std::string first_packet = MakeRtpPacket(0, 0, std::string("e0"));
  // The extension "e0" padded to one word, after the profile "VV" and a length of 1.
  EXPECT_EQ(first_packet.substr(12, 8), std::string("VV\x00\x01" "e0\x00\x00", 8));
  const std::string framed = std::string("$\x00", 2) + static_cast<char>(0) +
                             static_cast<char>(first_packet.size()) + first_packet;
  EXPECT_TRUE(ReadOnUntil(answer, framed));
  // After ten packets an RTCP sender report follows on channel 1.
  EXPECT_TRUE(ReadOnUntil(answer, std::string("$\x01\x00\x1c\x80\xc8", 6)));
}

TEST_F(RtspServerTest, AsksForCredentialsWithTheRequestsCSeq) {
  RtspStream stream;
  stream.auth = HttpAuth(AuthScheme::kDigest, "admin", "pw");
  Serve(stream);
  std::string answer = Ask("OPTIONS", Url(), 3);
  EXPECT_EQ(answer.rfind("RTSP/1.0 401 Unauthorized\r\nCSeq: 3\r\nWWW-Authenticate: Digest ", 0),
            0u)
      << answer;
  // The connection stays open for the answer with credentials.
  answer = Ask("OPTIONS", Url(), 4);
  EXPECT_EQ(answer.rfind("RTSP/1.0 401 Unauthorized\r\nCSeq: 4\r\n", 0), 0u) << answer;
}

TEST_F(RtspServerTest, SessionLeftSilentForItsTimeoutIsClosed) {
  RtspStream stream;
  stream.session_timeout = 1;
  Serve(stream);
  std::string answer =
      Ask("SETUP", Url("/trackID=1"), 1, "Transport: RTP/AVP/TCP;unicast;interleaved=0-1\r\n");
  ASSERT_NE(answer.find("timeout=1"), std::string::npos) << answer;
  EXPECT_TRUE(client_->WaitClosed(std::chrono::seconds(10)));
}

TEST_F(RtspServerTest, TeardownEndsTheSession) {
  Serve(RtspStream());
  std::string answer = Ask("TEARDOWN", Url("/"), 5, "Session: 5A1B2C3D\r\n");
  EXPECT_EQ(answer.rfind("RTSP/1.0 200 OK\r\nCSeq: 5\r\n", 0), 0u) << answer;
  EXPECT_TRUE(client_->WaitClosed());
}

}  // namespace
}  // namespace evsim
