#include "framework/host/rtpfetch.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "sim/net/rtspserver.h"
#include "tests/support/fakertspcamera.h"

namespace {

using evsim::AuthScheme;
using evsim::HttpAuth;
using evsim::RtspStream;
using evtest::FakeRtspCamera;

constexpr char kPath[] = "/live.sdp";
constexpr char kClient[] = "RTPExPlayer";

// Extension data that names its packet: "pkt" and the number, padded by the camera.
std::optional<std::string> Numbered(uint64_t n) { return "pkt" + std::to_string(n); }

std::string Padded(std::string text) {
  text.resize((text.size() + 3) / 4 * 4, '\0');
  return text;
}

RtspStream Fast() {
  RtspStream s;
  s.period = std::chrono::milliseconds(5);
  s.extension = Numbered;
  return s;
}

// The extension data of the next packet, or nullopt when the reader fails.
std::optional<std::string> NextExt(RtpFetch& fetch) {
  unsigned int length = 99;
  if (fetch.NextHdrInfo(length) != 0) return std::nullopt;
  std::string data(length, '\0');
  if (length > 0 &&
      fetch.FetchExtData(reinterpret_cast<unsigned char*>(&data[0]), length) != 0) {
    return std::nullopt;
  }
  return data;
}

TEST(RtpFetchTest, SetsUpTheVideoTrackInterleavedAndReadsEachPacketsExtension) {
  FakeRtspCamera cam([](int) { return Fast(); });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
  // Ten RTCP reports come on channel 1 within the first hundred packets; none of them is
  // delivered, so the packet numbers run without a gap.
  for (int n = 0; n < 100; ++n) {
    std::optional<std::string> ext = NextExt(fetch);
    ASSERT_TRUE(ext.has_value()) << "packet " << n;
    EXPECT_EQ(*ext, Padded("pkt" + std::to_string(n)));
  }

  const std::vector<evsim::HttpRequest> requests = cam.Requests();
  ASSERT_EQ(cam.Methods(),
            (std::vector<std::string>{"OPTIONS", "DESCRIBE", "SETUP", "PLAY"}));
  const std::string url = "rtsp://127.0.0.1:" + std::to_string(cam.Port()) + kPath;
  EXPECT_EQ(requests[0].target, url);
  EXPECT_EQ(requests[1].target, url);
  // The description lists an audio track first: the video track is the one set up.
  EXPECT_EQ(requests[2].target, url + "/trackID=1");
  EXPECT_EQ(requests[2].Header("Transport"), "RTP/AVP/TCP;unicast;interleaved=0-1");
  // PLAY goes to the presentation, in the session that SETUP opened.
  EXPECT_EQ(requests[3].target, url + "/");
  EXPECT_EQ(requests[3].Header("Session"), "5A1B2C3D");
  for (const evsim::HttpRequest& r : requests) {
    EXPECT_EQ(r.Header("User-Agent"), kClient) << r.method;
    EXPECT_EQ(r.Header("Authorization"), "") << r.method;
  }
  EXPECT_EQ(cam.Connections(), 1);
}

TEST(RtpFetchTest, PacketWithoutExtensionHasLengthZero) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.extension = [](uint64_t n) -> std::optional<std::string> {
      if (n % 2 == 1) return std::nullopt;
      return Numbered(n);
    };
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
  for (int n = 0; n < 6; ++n) {
    unsigned int length = 99;
    ASSERT_EQ(fetch.NextHdrInfo(length), 0);
    EXPECT_EQ(length, n % 2 == 1 ? 0u : 4u) << "packet " << n;
  }
  // A packet without extension has nothing to copy.
  unsigned char byte = 0;
  EXPECT_NE(fetch.FetchExtData(&byte, 1), 0);
}

TEST(RtpFetchTest, FetchExtDataRefusesWhatTheCurrentPacketDoesNotHold) {
  FakeRtspCamera cam([](int) { return Fast(); });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
  unsigned char buffer[16] = {};
  EXPECT_NE(fetch.FetchExtData(buffer, 4), 0);  // no packet yet
  EXPECT_EQ(cam.Connections(), 0);              // and nothing was opened for it

  unsigned int length = 0;
  ASSERT_EQ(fetch.NextHdrInfo(length), 0);
  ASSERT_EQ(length, 4u);
  EXPECT_NE(fetch.FetchExtData(buffer, 5), 0);
  EXPECT_NE(fetch.FetchExtData(nullptr, 4), 0);
  EXPECT_NE(fetch.FetchExtData(buffer, 0), 0);
  // A part of it, and then all of it: refusals do not harm the packet.
  ASSERT_EQ(fetch.FetchExtData(buffer, 2), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(buffer), 2), "pk");
  ASSERT_EQ(fetch.FetchExtData(buffer, 4), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(buffer), 4), "pkt0");

  // After SkipContent no packet is current.
  EXPECT_EQ(fetch.SkipContent(nullptr, 0), 0);
  EXPECT_NE(fetch.FetchExtData(buffer, 4), 0);
  ASSERT_EQ(fetch.NextHdrInfo(length), 0);
  ASSERT_EQ(fetch.FetchExtData(buffer, 4), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(buffer), 4), "pkt1");
}

TEST(RtpFetchTest, PartViewGivesThePayload) {
  FakeRtspCamera cam([](int) { return Fast(); });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
  int length = 0;
  char header[128] = "junk";
  ASSERT_EQ(fetch.ReadPartHeader(&length, header, sizeof(header)), 0);
  EXPECT_STREQ(header, "");
  const std::string expected = evsim::MakeRtpPacket(0, 0, Numbered(0)).substr(12 + 4 + 4);
  ASSERT_EQ(length, static_cast<int>(expected.size()));
  std::string body(static_cast<size_t>(length), '\0');
  ASSERT_EQ(fetch.ReadPartBody(&body[0], 3), 0);
  ASSERT_EQ(fetch.ReadPartBody(&body[3], length - 3), 0);
  EXPECT_EQ(body, expected);
  EXPECT_NE(fetch.ReadPartBody(&body[0], 1), 0);  // nothing left of it
}

TEST(RtpFetchTest, AnswersDigestChallengeOnEveryRequest) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.auth = HttpAuth(AuthScheme::kDigest, "admin", "p:a@ss");
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "admin", "p:a@ss", kClient);
  for (int n = 0; n < 5; ++n) {
    std::optional<std::string> ext = NextExt(fetch);
    ASSERT_TRUE(ext.has_value());
    EXPECT_EQ(*ext, Padded("pkt" + std::to_string(n)));
  }
  // The first request meets the challenge; every request that got an answer carried
  // Digest credentials.
  const std::vector<evsim::HttpRequest> requests = cam.Requests();
  ASSERT_GE(requests.size(), 5u);
  EXPECT_EQ(requests[0].method, "OPTIONS");
  EXPECT_EQ(requests[0].Header("Authorization"), "");
  std::vector<std::string> methods;
  for (const evsim::HttpRequest& r : requests) {
    if (r.Header("Authorization").empty()) continue;
    EXPECT_EQ(r.Header("Authorization").substr(0, 7), "Digest ") << r.method;
    methods.push_back(r.method);
  }
  EXPECT_EQ(methods, (std::vector<std::string>{"OPTIONS", "DESCRIBE", "SETUP", "PLAY"}));
}

TEST(RtpFetchTest, AnswersBasicChallenge) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.auth = HttpAuth(AuthScheme::kBasic, "admin", "secret");
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "admin", "secret", kClient);
  std::optional<std::string> ext = NextExt(fetch);
  ASSERT_TRUE(ext.has_value());
  EXPECT_EQ(*ext, Padded("pkt0"));
  const std::vector<evsim::HttpRequest> requests = cam.Requests();
  ASSERT_FALSE(requests.empty());
  EXPECT_EQ(requests.back().method, "PLAY");
  EXPECT_EQ(requests.back().Header("Authorization").substr(0, 6), "Basic ");
}

TEST(RtpFetchTest, WrongPasswordFailsAndStaysFailed) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.auth = HttpAuth(AuthScheme::kDigest, "admin", "secret");
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "admin", "wrong", kClient, 2);
  unsigned int length = 0;
  EXPECT_NE(fetch.NextHdrInfo(length), 0);
  // Only OPTIONS was tried, and never got past the challenge.
  for (const evsim::HttpRequest& r : cam.Requests()) EXPECT_EQ(r.method, "OPTIONS");
  const size_t seen = cam.Requests().size();
  EXPECT_GE(seen, 1u);
  EXPECT_NE(fetch.NextHdrInfo(length), 0);
  EXPECT_EQ(cam.Requests().size(), seen);  // a failed reader asks nothing more
  EXPECT_EQ(cam.Connections(), 1);
}

TEST(RtpFetchTest, KeepsTheSessionAliveBeforeItsTimeout) {
  // The camera ends a session that is silent for two seconds; packets come for three. Every
  // request needs Digest credentials, the keep-alives too.
  FakeRtspCamera cam([](int) {
    RtspStream s;
    s.session_timeout = 2;
    s.period = std::chrono::milliseconds(20);
    s.extension = Numbered;
    s.auth = HttpAuth(AuthScheme::kDigest, "admin", "secret");
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "admin", "secret", kClient, 2);
  for (int n = 0; n < 150; ++n) {
    std::optional<std::string> ext = NextExt(fetch);
    ASSERT_TRUE(ext.has_value()) << "packet " << n;
    EXPECT_EQ(*ext, Padded("pkt" + std::to_string(n)));
  }
  EXPECT_GE(cam.Count("GET_PARAMETER"), 1);
  for (const evsim::HttpRequest& r : cam.Requests()) {
    if (r.method != "GET_PARAMETER") continue;
    EXPECT_EQ(r.Header("Session"), "5A1B2C3D");
    EXPECT_EQ(r.Header("Authorization").substr(0, 7), "Digest ");
    EXPECT_EQ(r.target, "rtsp://127.0.0.1:" + std::to_string(cam.Port()) + kPath + "/");
  }
  EXPECT_EQ(cam.Connections(), 1);
}

TEST(RtpFetchTest, KeepsTheSessionAliveWithOptionsWhenGetParameterIsRefused) {
  FakeRtspCamera cam([](int) {
    RtspStream s;
    s.session_timeout = 2;
    s.get_parameter = false;
    s.period = std::chrono::milliseconds(20);
    s.extension = Numbered;
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient, 2);
  for (int n = 0; n < 150; ++n) {
    std::optional<std::string> ext = NextExt(fetch);
    ASSERT_TRUE(ext.has_value()) << "packet " << n;
    EXPECT_EQ(*ext, Padded("pkt" + std::to_string(n)));
  }
  // Asked once, refused, never asked again; OPTIONS in the session from then on.
  EXPECT_EQ(cam.Count("GET_PARAMETER"), 1);
  const std::vector<std::string> methods = cam.Methods();
  ASSERT_GE(methods.size(), 6u);
  EXPECT_EQ(methods[4], "GET_PARAMETER");
  EXPECT_EQ(methods[5], "OPTIONS");
  const std::string aggregate = "rtsp://127.0.0.1:" + std::to_string(cam.Port()) + kPath + "/";
  const std::vector<evsim::HttpRequest> requests = cam.Requests();
  for (size_t i = 5; i < requests.size(); ++i) {
    EXPECT_EQ(requests[i].method, "OPTIONS");
    EXPECT_EQ(requests[i].target, aggregate);
  }
  EXPECT_EQ(cam.Connections(), 1);
}

// An extension header of profile "VV" announcing one word of data.
const std::string kOneWord("\x56\x56\x00\x01", 4);

// RTP header fields in order: first byte, payload type, sequence, timestamp, SSRC.
std::string RtpHead(unsigned char first, uint16_t sequence) {
  std::string h;
  h += static_cast<char>(first);
  h += static_cast<char>(96);
  h += static_cast<char>(sequence >> 8);
  h += static_cast<char>(sequence & 0xff);
  h += std::string(4, '\0');      // timestamp
  h += std::string("\x12\x34\x56\x78", 4);  // SSRC
  return h;
}

TEST(RtpFetchTest, ReadsCsrcListAndPaddingAndPassesOverPacketsThatAreNotRtp) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.raw_packet = [](uint64_t n) -> std::optional<std::string> {
      switch (n) {
        case 0:  // two CSRCs, an extension of one word, payload "xyz", three bytes of padding
          return RtpHead(0xB2, 0) + std::string(8, '\x01') + kOneWord + "abcd" + "xyz" +
                 std::string("\0\0\x03", 3);
        case 1:  // version 1
          return std::string(1, '\x50') + RtpHead(0x90, 1).substr(1) + kOneWord + "efgh";
        case 2:  // an extension longer than the packet
          return RtpHead(0x90, 2) + std::string("\x56\x56\x00\x0a", 4) + "ijkl";
        case 3:  // shorter than an RTP header
          return std::string("\x90\x60\x00", 3);
        case 4:  // padding longer than the packet
          return RtpHead(0xA0, 4) + "pay" + std::string("\x20", 1);
        default:
          return std::nullopt;
      }
    };
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
  int length = 0;
  char header[128];
  ASSERT_EQ(fetch.ReadPartHeader(&length, header, sizeof(header)), 0);
  ASSERT_EQ(length, 3);
  std::string payload(3, '\0');
  ASSERT_EQ(fetch.ReadPartBody(&payload[0], 3), 0);
  EXPECT_EQ(payload, "xyz");
  unsigned char ext[4];
  ASSERT_EQ(fetch.FetchExtData(ext, 4), 0);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(ext), 4), "abcd");
  // Packets 1 to 4 are not RTP that can be read: the next one delivered is packet 5.
  std::optional<std::string> next = NextExt(fetch);
  ASSERT_TRUE(next.has_value());
  EXPECT_EQ(*next, Padded("pkt5"));
}

TEST(RtpFetchTest, CameraThatClosesTheSessionFailsTheReader) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.close_after = 4;
    return s;
  });
  RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient, 2);
  for (int n = 0; n < 4; ++n) {
    std::optional<std::string> ext = NextExt(fetch);
    ASSERT_TRUE(ext.has_value()) << "packet " << n;
    EXPECT_EQ(*ext, Padded("pkt" + std::to_string(n)));
  }
  unsigned int length = 0;
  EXPECT_NE(fetch.NextHdrInfo(length), 0);
  EXPECT_NE(fetch.NextHdrInfo(length), 0);
  EXPECT_EQ(cam.Connections(), 1);  // a failed reader does not reconnect by itself
}

TEST(RtpFetchTest, CameraThatStopsSendingFailsTheReaderAfterTheTimeout) {
  FakeRtspCamera cam([](int) {
    RtspStream s = Fast();
    s.silent_after = 3;
    return s;
  });
  {
    RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient, 1);
    for (int n = 0; n < 3; ++n) ASSERT_TRUE(NextExt(fetch).has_value()) << "packet " << n;
    unsigned int length = 0;
    EXPECT_NE(fetch.NextHdrInfo(length), 0);
  }
  // A reader whose connection failed does not wait for a TEARDOWN answer.
  EXPECT_EQ(cam.Count("TEARDOWN"), 0);
}

TEST(RtpFetchTest, DeletingTheReaderTearsTheSessionDown) {
  FakeRtspCamera cam([](int) { return Fast(); });
  {
    RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient);
    ASSERT_TRUE(NextExt(fetch).has_value());
  }
  ASSERT_TRUE(cam.WaitForMethod("TEARDOWN"));
  const evsim::HttpRequest teardown = cam.Requests().back();
  EXPECT_EQ(teardown.method, "TEARDOWN");
  EXPECT_EQ(teardown.Header("Session"), "5A1B2C3D");
  EXPECT_EQ(teardown.Header("User-Agent"), kClient);
}

TEST(RtpFetchTest, ReaderThatNeverOpenedSendsNothing) {
  FakeRtspCamera cam([](int) { return Fast(); });
  { RtpFetch fetch("127.0.0.1", cam.Port(), kPath, "", "", kClient); }
  EXPECT_EQ(cam.Connections(), 0);
}

TEST(RtpFetchTest, NoCameraListeningFails) {
  int port = 0;
  {
    FakeRtspCamera gone([](int) { return Fast(); });
    port = gone.Port();
  }
  RtpFetch fetch("127.0.0.1", port, kPath, "", "", kClient, 1);
  unsigned int length = 0;
  EXPECT_NE(fetch.NextHdrInfo(length), 0);
  RtpFetch no_host("", 554, kPath, "", "", kClient, 1);
  EXPECT_NE(no_host.NextHdrInfo(length), 0);
}

}  // namespace
