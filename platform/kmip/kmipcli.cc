// kmipcli: an operator's diagnostic tool for KMIP key servers.
//
//   kmipcli --host H --port P [--ca FILE]... [--cert FILE --key FILE]
//           [--proxy H:P] [--user U --password-file F] [--timeout S]
//           versions | state ID | key-info ID | server-cert
//
// versions     the protocol versions the server speaks, one per line
// state ID     the State attribute of the object, as number and name
// key-info ID  the length and SHA-256 fingerprint of a symmetric key (the key
//              bytes themselves are never printed)
// server-cert  the certificate the server presents, as PEM (no trust needed)
//
// Failures print "kmipcli: error N: explanation" on standard error and exit
// with status 1; wrong usage exits with status 2.
#include <openssl/evp.h>

#include <cstdio>
#include <iostream>
#include <string>
#include <vector>

#include "platform/kmip/qlkmipsimple.h"
#include "platform/kmip/session_description.h"
#include "platform/util/files.h"
#include "platform/util/secure_buffer.h"

namespace {

constexpr const char* kUsage =
    "usage: kmipcli --host H --port P [--ca FILE]... [--cert FILE --key FILE]\n"
    "               [--proxy H:P] [--user U --password-file F] [--timeout S]\n"
    "               versions | state ID | key-info ID | server-cert\n";

int Usage(const std::string& why) {
  std::cerr << "kmipcli: " << why << "\n" << kUsage;
  return 2;
}

bool ParsePort(const std::string& text, uint16_t* port) {
  if (text.empty() || text.size() > 5 ||
      text.find_first_not_of("0123456789") != std::string::npos) {
    return false;
  }
  int p = std::stoi(text);
  if (p < 1 || p > 65535) return false;
  *port = static_cast<uint16_t>(p);
  return true;
}

int Report(const qlc_result* r) {
  std::cerr << "kmipcli: error " << qlc_ok(r) << ": " << qlc_explain(r) << "\n";
  return 1;
}

const char* StateName(int state) {
  static const char* const kNames[] = {
      "",          "Pre-Active",           "Active", "Deactivated", "Compromised",
      "Destroyed", "Destroyed Compromised"};
  return state >= 1 && state <= 6 ? kNames[state] : "unknown";
}

struct Options {
  Qlc::SessionConfig config;
  std::string user;
  Groundwork::SecureString password;
  std::vector<std::string> command;
};

// A session's command with the credential options when a user is given.
qlc_result* Run(qlc_session* s, const Options& o, const std::string& base, const char* id) {
  if (o.user.empty()) {
    return id ? qlc_perform(s, base.c_str(), id) : qlc_perform(s, base.c_str());
  }
  std::string full = base + ", Options={Authentication={User=%s, Password=%s}}";
  return id ? qlc_perform(s, full.c_str(), id, o.user.c_str(), o.password.data())
            : qlc_perform(s, full.c_str(), o.user.c_str(), o.password.data());
}

int ServerCert(Options& o) {
  o.config.trustedCertificates.clear();
  Groundwork::SecureString description = Qlc::FormatSessionDescription(o.config);
  qlc_session* session = nullptr;
  qlc_result* r = qlc_connect_key_manager(&session, description.data());
  int rc = 0;
  qlc_server_credentials* cred = nullptr;
  if (qlc_ok(r) == QLC_E_UNTRUSTED_SERVER && qlc_fetch_server_credentials(r, &cred) == QLC_OK &&
      cred->format == QLC_CERT_FORMAT_PEM) {
    std::fwrite(cred->data, 1, cred->length, stdout);
  } else if (qlc_ok(r) == QLC_OK) {
    std::cerr << "kmipcli: the server was trusted without any trusted certificate\n";
    rc = 1;
  } else {
    rc = Report(r);
  }
  qlc_free_credentials(cred);
  qlc_release(r);
  qlc_disconnect_key_manager(session);
  return rc;
}

int Perform(qlc_session* s, const Options& o) {
  const std::string& verb = o.command[0];
  const char* id = o.command.size() > 1 ? o.command[1].c_str() : nullptr;
  qlc_result* r = nullptr;
  int rc = 0;
  if (verb == "versions") {
    r = Run(s, o, "Query, Versions", nullptr);
    if (qlc_ok(r) != QLC_OK) return Report(r), qlc_release(r), 1;
    for (const qlc_node* n = qlc_find("Versions/", r); n != nullptr; n = qlc_next(n)) {
      char* text = nullptr;
      if (qlc_value_of(nullptr, n, "%s", &text) == QLC_OK) std::cout << text << "\n";
      qlc_free(text);
    }
  } else if (verb == "state") {
    r = Run(s, o, "Get, Attributes, Id=%s, Names=State", id);
    int state = 0;
    if (qlc_ok(r) != QLC_OK || qlc_value_of("Attributes/State", r, "d", &state) != QLC_OK) {
      rc = Report(r);
    } else {
      std::cout << state << " (" << StateName(state) << ")\n";
    }
  } else {
    r = Run(s, o, "Get, Object, Id=%s", id);
    unsigned char* key = nullptr;
    int length = 0;
    if (qlc_ok(r) != QLC_OK ||
        qlc_value_of("Symmetric_Key/Key", r, "bs", &key, &length) != QLC_OK) {
      rc = Report(r);
    } else {
      unsigned char digest[EVP_MAX_MD_SIZE];
      unsigned int digest_len = 0;
      EVP_Digest(key, static_cast<size_t>(length), digest, &digest_len, EVP_sha256(), nullptr);
      qlc_free(key);
      std::printf("length: %d bytes (%d bits)\nsha256: ", length, length * 8);
      for (unsigned i = 0; i < digest_len; ++i) std::printf("%02x", digest[i]);
      std::printf("\n");
    }
  }
  qlc_release(r);
  return rc;
}

}  // namespace

int main(int argc, char** argv) {
  Options o;
  o.config.timeoutSeconds = 30;
  bool have_port = false;
  std::string cert_file, key_file, password_file;
  std::vector<std::string> args(argv + 1, argv + argc);
  for (size_t i = 0; i < args.size(); ++i) {
    const std::string& a = args[i];
    bool is_option = a.size() > 2 && a.compare(0, 2, "--") == 0;
    if (!is_option) {
      o.command.push_back(a);
      continue;
    }
    if (i + 1 >= args.size()) return Usage(a + " needs a value");
    const std::string& v = args[++i];
    if (a == "--host") {
      o.config.server.host = v;
    } else if (a == "--port") {
      if (!ParsePort(v, &o.config.server.port)) return Usage("bad --port");
      have_port = true;
    } else if (a == "--ca") {
      Groundwork::SecureString pem;
      if (!Groundwork::ReadSecretFile(v, &pem)) return Usage("cannot read " + v);
      o.config.trustedCertificates.emplace_back(pem.view());
    } else if (a == "--cert") {
      cert_file = v;
    } else if (a == "--key") {
      key_file = v;
    } else if (a == "--proxy") {
      size_t colon = v.rfind(':');
      Qlc::Endpoint proxy;
      if (colon == std::string::npos || !ParsePort(v.substr(colon + 1), &proxy.port)) {
        return Usage("bad --proxy, expected HOST:PORT");
      }
      proxy.host = v.substr(0, colon);
      o.config.proxy = proxy;
    } else if (a == "--user") {
      o.user = v;
    } else if (a == "--password-file") {
      password_file = v;
    } else if (a == "--timeout") {
      if (v.empty() || v.size() > 5 || v.find_first_not_of("0123456789") != std::string::npos ||
          std::stoi(v) < 1) {
        return Usage("bad --timeout");
      }
      o.config.timeoutSeconds = std::stoi(v);
    } else {
      return Usage("unknown option " + a);
    }
  }
  if (o.config.server.host.empty() || !have_port) return Usage("--host and --port are required");
  if (cert_file.empty() != key_file.empty()) return Usage("--cert and --key go together");
  if (!cert_file.empty()) {
    Groundwork::SecureString cert;
    if (!Groundwork::ReadSecretFile(cert_file, &cert)) return Usage("cannot read " + cert_file);
    if (!Groundwork::ReadSecretFile(key_file, &o.config.clientPrivateKey))
      return Usage("cannot read " + key_file);
    o.config.clientCertificate.assign(cert.view());
  }
  if (o.user.empty() != password_file.empty())
    return Usage("--user and --password-file go together");
  if (!password_file.empty()) {
    if (!Groundwork::ReadSecretFile(password_file, &o.password))
      return Usage("cannot read " + password_file);
    auto& p = o.password.str();
    size_t end = p.find_first_of("\r\n");
    if (end != std::string::npos) p.resize(end);
  }
  if (o.command.empty()) return Usage("no command");
  const std::string& verb = o.command[0];
  bool needs_id = verb == "state" || verb == "key-info";
  if ((verb != "versions" && verb != "server-cert" && !needs_id) ||
      o.command.size() != (needs_id ? 2u : 1u)) {
    return Usage("unknown command or wrong arguments");
  }
  if (verb == "server-cert") return ServerCert(o);

  Groundwork::SecureString description = Qlc::FormatSessionDescription(o.config);
  qlc_session* session = nullptr;
  qlc_result* r = qlc_connect_key_manager(&session, description.data());
  if (qlc_ok(r) != QLC_OK) {
    int rc = Report(r);
    qlc_release(r);
    return rc;
  }
  qlc_release(r);
  int rc = Perform(session, o);
  qlc_disconnect_key_manager(session);
  return rc;
}
