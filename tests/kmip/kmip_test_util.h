// Shared helpers of the KMIP library tests: one throwaway PKI per test
// program, session configurations, and a connect wrapper.
#pragma once

#include <string>
#include <vector>

#include "platform/kmip/qlkmipsimple.h"
#include "platform/kmip/session_description.h"
#include "tests/support/pykmip_server.h"

namespace KmipTest {

inline const ZyrdTest::TestPki& Pki() {
  static ZyrdTest::TestPki pki;
  return pki;
}

// A description for host:port trusting the named PKI certificates and
// presenting the named client (none when empty).
inline Qlc::SessionConfig Config(const std::string& host, uint16_t port,
                                 const std::vector<std::string>& trusted,
                                 const std::string& client = "client", int timeout = 5) {
  Qlc::SessionConfig c;
  c.server = {host, port};
  c.timeoutSeconds = timeout;
  for (const std::string& t : trusted) c.trustedCertificates.push_back(Pki().Pem(t));
  if (!client.empty()) {
    c.clientCertificate = Pki().Pem(client);
    c.clientPrivateKey.assign(Pki().Key(client));
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

// The outcome of one command.
struct Outcome {
  int number = -1;
  std::string explanation;
};

inline Outcome Take(qlc_result* r) {
  Outcome o{qlc_ok(r), qlc_explain(r)};
  qlc_release(r);
  return o;
}

// The texts of the nodes from "Versions/" on.
inline std::vector<std::string> VersionTexts(const qlc_result* r) {
  std::vector<std::string> versions;
  for (const qlc_node* n = qlc_find("Versions/", r); n; n = qlc_next(n)) {
    char* text = nullptr;
    if (qlc_value_of(nullptr, n, "%s", &text) != QLC_OK) return {"(unreadable)"};
    versions.push_back(text);
    qlc_free(text);
  }
  return versions;
}

}  // namespace KmipTest
