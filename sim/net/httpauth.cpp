#include "sim/net/httpauth.h"

#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <openssl/rand.h>

#include <cctype>
#include <map>
#include <random>
#include <string_view>
#include <utility>

#include "host/text/strutil.h"

namespace evsim {

namespace {

std::string Hex(const unsigned char* bytes, size_t size) {
  static const char kDigits[] = "0123456789abcdef";
  std::string out;
  out.reserve(size * 2);
  for (size_t i = 0; i < size; ++i) {
    out += kDigits[bytes[i] >> 4];
    out += kDigits[bytes[i] & 0xf];
  }
  return out;
}

std::string Md5Hex(const std::string& text) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int size = 0;
  if (EVP_Digest(text.data(), text.size(), digest, &size, EVP_md5(), nullptr) != 1) return "";
  return Hex(digest, size);
}

std::string Base64(const std::string& text) {
  std::string out(4 * ((text.size() + 2) / 3) + 1, '\0');
  int n = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&out[0]),
                          reinterpret_cast<const unsigned char*>(text.data()),
                          static_cast<int>(text.size()));
  out.resize(n > 0 ? static_cast<size_t>(n) : 0);
  return out;
}

std::string FreshNonce() {
  unsigned char bytes[16];
  if (RAND_bytes(bytes, sizeof(bytes)) != 1) {
    std::random_device device;
    for (unsigned char& b : bytes) b = static_cast<unsigned char>(device());
  }
  return Hex(bytes, sizeof(bytes));
}

bool SameSecret(const std::string& a, const std::string& b) {
  return a.size() == b.size() && CRYPTO_memcmp(a.data(), b.data(), a.size()) == 0;
}

void SkipSpaceAndCommas(std::string_view& s) {
  while (!s.empty() && (s.front() == ' ' || s.front() == '\t' || s.front() == ',')) {
    s.remove_prefix(1);
  }
}

void SkipSpace(std::string_view& s) {
  while (!s.empty() && (s.front() == ' ' || s.front() == '\t')) s.remove_prefix(1);
}

// A quoted-string with backslash escapes, or a token up to a comma or blank.
std::string TakeValue(std::string_view& s) {
  std::string value;
  if (!s.empty() && s.front() == '"') {
    s.remove_prefix(1);
    while (!s.empty() && s.front() != '"') {
      if (s.front() == '\\' && s.size() > 1) s.remove_prefix(1);
      value += s.front();
      s.remove_prefix(1);
    }
    if (!s.empty()) s.remove_prefix(1);
    return value;
  }
  while (!s.empty() && s.front() != ',' && s.front() != ' ' && s.front() != '\t') {
    value += s.front();
    s.remove_prefix(1);
  }
  return value;
}

// The name=value pairs of a Digest credentials header, names in lower case.
std::map<std::string, std::string> ParseParams(std::string_view s) {
  std::map<std::string, std::string> params;
  for (;;) {
    SkipSpaceAndCommas(s);
    if (s.empty()) break;
    std::string name;
    while (!s.empty() && s.front() != '=' && s.front() != ',' && s.front() != ' ') {
      name += static_cast<char>(std::tolower(static_cast<unsigned char>(s.front())));
      s.remove_prefix(1);
    }
    SkipSpace(s);
    if (s.empty() || s.front() != '=') continue;
    s.remove_prefix(1);
    SkipSpace(s);
    params.emplace(std::move(name), TakeValue(s));
  }
  return params;
}

std::string Quote(const std::string& text) {
  std::string out = "\"";
  for (char c : text) {
    if (c == '"' || c == '\\') out += '\\';
    out += c;
  }
  return out + "\"";
}

// Splits "Scheme rest" into the scheme and the rest.
std::pair<std::string_view, std::string_view> SplitScheme(std::string_view header) {
  SkipSpace(header);
  size_t space = header.find_first_of(" \t");
  if (space == std::string_view::npos) return {header, {}};
  return {header.substr(0, space), header.substr(space + 1)};
}

}  // namespace

HttpAuth::HttpAuth(AuthScheme scheme, std::string user, std::string password, std::string realm)
    : scheme_(scheme),
      user_(std::move(user)),
      password_(std::move(password)),
      realm_(std::move(realm)),
      nonce_(FreshNonce()) {}

bool HttpAuth::Accepts(const HttpRequest& request) const {
  if (scheme_ == AuthScheme::kNone) return true;
  const std::string header = request.Header("Authorization");
  auto [scheme, rest] = SplitScheme(header);
  if (scheme_ == AuthScheme::kBasic) {
    if (!EqualsNoCase(scheme, "Basic")) return false;
    std::string_view token = rest;
    SkipSpace(token);
    while (!token.empty() && (token.back() == ' ' || token.back() == '\t')) token.remove_suffix(1);
    return SameSecret(std::string(token), Base64(user_ + ":" + password_));
  }
  if (!EqualsNoCase(scheme, "Digest")) return false;
  auto params = ParseParams(rest);
  auto get = [&params](const char* name) {
    auto it = params.find(name);
    return it == params.end() ? std::string() : it->second;
  };
  const std::string uri = get("uri");
  const std::string algorithm = get("algorithm");
  const std::string qop = get("qop");
  if (get("username") != user_ || get("realm") != realm_ || get("nonce") != nonce_) return false;
  // Some clients leave the query out of the digest uri.
  if (uri != request.target && uri != request.Path()) return false;
  if (!algorithm.empty() && !EqualsNoCase(algorithm, "MD5")) return false;
  const std::string ha1 = Md5Hex(user_ + ":" + realm_ + ":" + password_);
  const std::string ha2 = Md5Hex(request.method + ":" + uri);
  std::string expected;
  if (qop.empty()) {
    expected = Md5Hex(ha1 + ":" + nonce_ + ":" + ha2);
  } else {
    const std::string nc = get("nc");
    const std::string cnonce = get("cnonce");
    if (!EqualsNoCase(qop, "auth") || nc.empty() || cnonce.empty()) return false;
    expected = Md5Hex(ha1 + ":" + nonce_ + ":" + nc + ":" + cnonce + ":" + qop + ":" + ha2);
  }
  std::string response = get("response");
  for (char& c : response) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return !expected.empty() && SameSecret(response, expected);
}

std::string HttpAuth::Challenge() const {
  return MakeResponse(401, "text/plain", "401 Unauthorized\n", {ChallengeHeader()});
}

std::string HttpAuth::ChallengeHeader() const {
  std::string challenge;
  if (scheme_ == AuthScheme::kDigest) {
    challenge = "WWW-Authenticate: Digest realm=" + Quote(realm_) + ", qop=\"auth\", nonce=\"" +
                nonce_ + "\", algorithm=MD5";
  } else {
    challenge = "WWW-Authenticate: Basic realm=" + Quote(realm_);
  }
  return challenge;
}

}  // namespace evsim
