// Shared helpers of the KMIP library tests: session configurations from the
// test PKI, a connection, and command results that release themselves.
#pragma once

#include <string>
#include <vector>

#include "platform/kmip/qlkmipsimple.h"
#include "platform/kmip/session_description.h"
#include "tests/support/kmip_env.h"

namespace KmipTest {

using ZyrdTest::PkiKey;
using ZyrdTest::PkiPem;

// A description for host:port trusting the named PKI certificates and
// presenting the named client (none when empty).
inline Qlc::SessionConfig Config(uint16_t port, const std::vector<std::string>& trusted = {"ca"},
                                 const std::string& client = "client", int timeout = 5,
                                 const std::string& host = "127.0.0.1") {
  Qlc::SessionConfig c;
  c.server = {host, port};
  c.timeoutSeconds = timeout;
  for (const std::string& t : trusted) c.trustedCertificates.push_back(PkiPem(t));
  if (!client.empty()) {
    c.clientCertificate = PkiPem(client);
    c.clientPrivateKey.assign(PkiKey(client));
  }
  return c;
}

// Connects on construction and disconnects on destruction.
struct Connection {
  explicit Connection(const Qlc::SessionConfig& config) {
    qlc_result* r = qlc_connect_key_manager(&session, Qlc::FormatSessionDescription(config).data());
    number = qlc_ok(r);
    explanation = qlc_explain(r);
    qlc_server_credentials* cred = nullptr;
    fetch = qlc_fetch_server_credentials(r, &cred);
    if (cred != nullptr) {
      format = cred->format;
      serverCert.assign(reinterpret_cast<const char*>(cred->data), cred->length);
    }
    qlc_free_credentials(cred);
    qlc_release(r);
  }
  ~Connection() { qlc_disconnect_key_manager(session); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  qlc_session* session = nullptr;
  int number = -1;
  std::string explanation;
  int fetch = -1;  // qlc_fetch_server_credentials on the connect result
  int format = 0;
  std::string serverCert;
};

// The result of one command, released when it goes away.
struct Result {
  explicit Result(qlc_result* result) : r(result) {}
  ~Result() { qlc_release(r); }
  Result(const Result&) = delete;
  Result& operator=(const Result&) = delete;

  int number() const { return qlc_ok(r); }
  std::string explanation() const { return qlc_explain(r); }
  // The byte string at `path` ("" when the look-up fails).
  std::vector<uint8_t> Bytes(const char* path) const {
    unsigned char* bytes = nullptr;
    int length = 0;
    if (qlc_value_of(path, r, "bs", &bytes, &length) != QLC_OK) return {};
    std::vector<uint8_t> out(bytes, bytes + length);
    qlc_free(bytes);
    return out;
  }
  // The integer at `path` (-1 when the look-up fails).
  int Int(const char* path) const {
    int value = -1;
    return qlc_value_of(path, r, "d", &value) == QLC_OK ? value : -1;
  }
  // The texts of the nodes from "Versions/" on.
  std::vector<std::string> Versions() const {
    std::vector<std::string> versions;
    for (const qlc_node* n = qlc_find("Versions/", r); n; n = qlc_next(n)) {
      char* text = nullptr;
      if (qlc_value_of(nullptr, n, "%s", &text) != QLC_OK) return {"(unreadable)"};
      versions.push_back(text);
      qlc_free(text);
    }
    return versions;
  }

  qlc_result* r;
};

template <typename... Args>
Result Perform(qlc_session* session, const char* command, Args... args) {
  return Result(qlc_perform(session, command, args...));
}

}  // namespace KmipTest
