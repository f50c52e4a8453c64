#include "sim/net/httpauth.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/loopbackclient.h"

namespace evsim {
namespace {

HttpRequest Get(const std::string& target, const std::string& authorization = "") {
  HttpRequest request;
  request.method = "GET";
  request.target = target;
  request.version = "HTTP/1.1";
  if (!authorization.empty()) request.headers.emplace_back("Authorization", authorization);
  return request;
}

// The value of an Authorization header line built by the test client.
std::string Value(const std::string& header_line) {
  const std::string prefix = "Authorization: ";
  return header_line.substr(prefix.size(), header_line.size() - prefix.size() - 2);
}

std::string NonceOf(const std::string& challenge) {
  size_t at = challenge.find("nonce=\"");
  if (at == std::string::npos) return "";
  at += 7;
  return challenge.substr(at, challenge.find('"', at) - at);
}

TEST(HttpAuthTest, NoneAcceptsEverything) {
  HttpAuth none;
  EXPECT_EQ(none.Scheme(), AuthScheme::kNone);
  EXPECT_TRUE(none.Accepts(Get("/x")));
  EXPECT_TRUE(none.Accepts(Get("/x", "Basic Zm9vOmJhcg==")));
}

TEST(HttpAuthTest, BasicAcceptsTheRightCredentials) {
  HttpAuth auth(AuthScheme::kBasic, "admin", "se:cr\xc3\xa9t");
  EXPECT_TRUE(auth.Accepts(Get("/x", Value(evtest::BasicAuthorization("admin", "se:cr\xc3\xa9t")))));
  // "admin:secret" in Base64, with the scheme name in another case.
  HttpAuth plain(AuthScheme::kBasic, "admin", "secret");
  EXPECT_TRUE(plain.Accepts(Get("/x", "basic YWRtaW46c2VjcmV0")));
}

TEST(HttpAuthTest, BasicRefusesWrongOrMissingCredentials) {
  HttpAuth auth(AuthScheme::kBasic, "admin", "secret");
  EXPECT_FALSE(auth.Accepts(Get("/x")));
  EXPECT_FALSE(auth.Accepts(Get("/x", Value(evtest::BasicAuthorization("admin", "secreT")))));
  EXPECT_FALSE(auth.Accepts(Get("/x", Value(evtest::BasicAuthorization("admin:", "secret")))));
  EXPECT_FALSE(auth.Accepts(Get("/x", "Basic")));
  EXPECT_FALSE(auth.Accepts(Get("/x", "Digest YWRtaW46c2VjcmV0")));
}

TEST(HttpAuthTest, ChallengesAreComplete401Responses) {
  HttpAuth basic(AuthScheme::kBasic, "u", "p", "cam \"one\"");
  std::string challenge = basic.Challenge();
  EXPECT_EQ(challenge.rfind("HTTP/1.1 401 Unauthorized\r\n", 0), 0u);
  EXPECT_NE(challenge.find("\r\nWWW-Authenticate: Basic realm=\"cam \\\"one\\\"\"\r\n"),
            std::string::npos);
  EXPECT_NE(challenge.find("\r\n\r\n"), std::string::npos);

  HttpAuth digest(AuthScheme::kDigest, "u", "p");
  challenge = digest.Challenge();
  EXPECT_EQ(challenge.rfind("HTTP/1.1 401 Unauthorized\r\n", 0), 0u);
  EXPECT_NE(challenge.find("WWW-Authenticate: Digest realm=\"camera\""), std::string::npos);
  EXPECT_NE(challenge.find("qop=\"auth\""), std::string::npos);
  EXPECT_NE(challenge.find("algorithm=MD5"), std::string::npos);
  EXPECT_FALSE(NonceOf(challenge).empty());
  EXPECT_NE(NonceOf(challenge), NonceOf(HttpAuth(AuthScheme::kDigest, "u", "p").Challenge()));
}

TEST(HttpAuthTest, DigestAcceptsAResponseComputedIndependently) {
  HttpAuth auth(AuthScheme::kDigest, "admin", "pa:ss w\xc3\xb6rd");
  const std::string challenge = auth.Challenge();
  const std::string nonce = NonceOf(challenge);
  const std::string target = "/cgi-bin/motion.cgi?ch=1";

  EXPECT_TRUE(auth.Accepts(Get(target, Value(evtest::DigestAuthorization(
                                           challenge, "GET", target, "admin",
                                           "pa:ss w\xc3\xb6rd")))));
  EXPECT_TRUE(auth.Accepts(Get(target, Value(evtest::DigestAuthorization(
                                           challenge, "GET", target, "admin",
                                           "pa:ss w\xc3\xb6rd", false)))));

  // Written out by hand: RFC 7616 response with qop=auth.
  const std::string ha1 = evtest::Md5Hex("admin:camera:pa:ss w\xc3\xb6rd");
  const std::string ha2 = evtest::Md5Hex("GET:" + target);
  const std::string response =
      evtest::Md5Hex(ha1 + ":" + nonce + ":0000000a:xyz:auth:" + ha2);
  EXPECT_TRUE(auth.Accepts(Get(target, "Digest username=\"admin\",realm=\"camera\",nonce=\"" +
                                           nonce + "\",uri=\"" + target + "\",cnonce=\"xyz\"," +
                                           "nc=0000000a,qop=\"auth\",response=\"" + response +
                                           "\"")));
}

TEST(HttpAuthTest, DigestRefusesWrongResponses) {
  HttpAuth auth(AuthScheme::kDigest, "admin", "secret");
  const std::string challenge = auth.Challenge();
  const std::string target = "/a.cgi";
  auto with = [&](const std::string& method, const std::string& uri, const std::string& user,
                  const std::string& password) {
    return Get(target, Value(evtest::DigestAuthorization(challenge, method, uri, user, password)));
  };
  EXPECT_TRUE(auth.Accepts(with("GET", target, "admin", "secret")));
  EXPECT_FALSE(auth.Accepts(with("GET", target, "admin", "Secret")));
  EXPECT_FALSE(auth.Accepts(with("GET", target, "root", "secret")));
  EXPECT_FALSE(auth.Accepts(with("POST", target, "admin", "secret")));
  EXPECT_FALSE(auth.Accepts(with("GET", "/b.cgi", "admin", "secret")));
  EXPECT_FALSE(auth.Accepts(Get(target)));
  // A response to another server's nonce.
  HttpAuth other(AuthScheme::kDigest, "admin", "secret");
  EXPECT_FALSE(auth.Accepts(Get(target, Value(evtest::DigestAuthorization(
                                            other.Challenge(), "GET", target, "admin",
                                            "secret")))));
  // Basic credentials do not satisfy a Digest challenge.
  EXPECT_FALSE(auth.Accepts(Get(target, Value(evtest::BasicAuthorization("admin", "secret")))));
}

TEST(HttpAuthTest, DigestUserNameMayHoldQuotesAndBackslashes) {
  const std::string user = "we\"ird\\user";
  HttpAuth auth(AuthScheme::kDigest, user, "pw");
  const std::string nonce = NonceOf(auth.Challenge());
  const std::string ha1 = evtest::Md5Hex(user + ":camera:pw");
  const std::string ha2 = evtest::Md5Hex("GET:/x");
  const std::string response = evtest::Md5Hex(ha1 + ":" + nonce + ":" + ha2);
  EXPECT_TRUE(auth.Accepts(Get("/x", "Digest username=\"we\\\"ird\\\\user\", realm=\"camera\", "
                                     "nonce=\"" + nonce + "\", uri=\"/x\", response=\"" +
                                         response + "\"")));
}

}  // namespace
}  // namespace evsim
