// Server side of HTTP Basic and Digest authentication (RFC 7617, RFC 7616 with MD5 and
// qop=auth), for camera emulations and fake cameras. Stateless apart from the nonce.

#ifndef EVWATCH_SIM_NET_HTTPAUTH_H_
#define EVWATCH_SIM_NET_HTTPAUTH_H_

#include <string>

#include "sim/net/httpserver.h"

namespace evsim {

enum class AuthScheme { kNone, kBasic, kDigest };

class HttpAuth {
 public:
  HttpAuth() = default;
  HttpAuth(AuthScheme scheme, std::string user, std::string password,
           std::string realm = "camera");

  // Whether the request carries valid credentials (always true for kNone).
  bool Accepts(const HttpRequest& request) const;
  // The 401 response with the challenge of this scheme.
  std::string Challenge() const;
  // The challenge's header line alone ("WWW-Authenticate: ..."), for other protocols that
  // authenticate like HTTP (RTSP).
  std::string ChallengeHeader() const;
  AuthScheme Scheme() const { return scheme_; }

 private:
  AuthScheme scheme_ = AuthScheme::kNone;
  std::string user_, password_, realm_, nonce_;
};

}  // namespace evsim

#endif  // EVWATCH_SIM_NET_HTTPAUTH_H_
