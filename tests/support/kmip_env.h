// The real KMIP server (PyKMIP) a test program runs beside. ctest starts the
// program through tests/support/with_pykmip.py, which starts the server on a
// free 127.0.0.1 port with a throwaway PKI, creates the keys, and stops it
// when the program ends; what the program needs comes in the environment.
// Programs that need only the certificates run with the PKI alone.
//
// PKI names (tools/pykmip_tool.py): "ca", "server", "client", "client2",
// "noeku", "other_ca", "other_server", "other_client", "wronghost",
// "selfsigned". Keys, owned by CN "client": "aes128" and "aes256" (active),
// "preactive", "deactivated", "compromised", and "destroyed" (gone from the
// server; only its bytes remain), the last four of 256 bits.
#pragma once

#include <cstdio>
#include <cstdlib>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/hex.h"
#include "tests/support/temp_dir.h"

namespace ZyrdTest {

inline std::string TestEnv(const char* name) {
  const char* value = std::getenv(name);
  if (value == nullptr) {
    std::fprintf(stderr, "%s is not set: run this program through ctest\n", name);
    std::abort();
  }
  return value;
}

// The PEM certificate and the private key of a PKI name.
inline std::string PkiPem(const std::string& name) {
  return ReadFile(TestEnv("ZYRD_TEST_PKI") + "/" + name + ".pem");
}
inline std::string PkiKey(const std::string& name) {
  return ReadFile(TestEnv("ZYRD_TEST_PKI") + "/" + name + ".key");
}

inline uint16_t KmipPort() {
  return static_cast<uint16_t>(std::stoi(TestEnv("ZYRD_TEST_KMIP_PORT")));
}

struct KmipKey {
  std::string id;
  std::vector<uint8_t> bytes;
};

inline KmipKey TestKey(const std::string& name) {
  std::istringstream in(TestEnv("ZYRD_TEST_KEYS"));
  for (std::string item; in >> item;) {  // name=id:hex
    const size_t eq = item.find('='), colon = item.rfind(':');
    if (item.substr(0, eq) == name)
      return {item.substr(eq + 1, colon - eq - 1), Unhex(item.substr(colon + 1))};
  }
  std::fprintf(stderr, "no test key '%s'\n", name.c_str());
  std::abort();
}

}  // namespace ZyrdTest
