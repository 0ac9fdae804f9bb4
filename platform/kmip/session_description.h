// The session description: the text that says where and how a KMIP session
// connects. Its grammar (blanks between tokens are free):
//
//   Presentation={Protocol=KMIP, Version='1.1', Format=TTLV},
//   Session = {[Proxy={Protocol=HTTP, Host='PROXY', Port='PPORT'},]
//              Protocol=SSL, Host='HOST', Port='PORT', Timeout=N:Seconds,
//              [Certificate=PEM:[HEX], Public=PEM:[HEX], Private=PEM:[HEX],]
//              User_Trust, Authenticate}
//   [, Trusted_Cert=PEM:[HEX]]...
//
// HEX is the PEM text with every byte written as two hexadecimal digits.
// Certificate is the client certificate (Public repeats it), Private its
// unencrypted private key; each Trusted_Cert holds one certificate (or a
// bundle) that the server's certificate is verified against. Host is a name,
// an IPv4 address or an IPv6 address (brackets optional). Ports are 1..65535;
// the time-out is at least one second (larger than kMaxTimeoutSeconds counts
// as that). Parsing and formatting are pure functions.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/util/secure_buffer.h"

namespace Qlc {

inline constexpr int kMaxTimeoutSeconds = 86400;

struct Endpoint {
  std::string host;
  uint16_t port = 0;
};

struct SessionConfig {
  int versionMajor = 1;
  int versionMinor = 1;
  std::optional<Endpoint> proxy;
  Endpoint server;
  int timeoutSeconds = 60;
  std::string clientCertificate;                 // PEM; empty: none presented
  Groundwork::SecureString clientPrivateKey;     // PEM
  std::vector<std::string> trustedCertificates;  // PEM texts
};

// Parses a description. On failure returns false with a reason that names the
// offending item (and never the text of a key).
bool ParseSessionDescription(std::string_view text, SessionConfig* out, std::string* error);

// Writes the description of `config` in the grammar above.
Groundwork::SecureString FormatSessionDescription(const SessionConfig& config);

}  // namespace Qlc
