// Test harness around a real KMIP server (PyKMIP, Debian's python3-pykmip).
//
// TestPki makes throwaway certificates once (tools/pykmip_tool.py
// lists them: "ca", "server", "client", "client2", "noeku", "other_ca",
// "other_server", "other_client", "wronghost", "selfsigned"); Pem(name) and
// Key(name) give the PEM texts, Path(name) the file.
//
// PyKmipServer starts /usr/bin/pykmip-server on a free 127.0.0.1 port with
// its own configuration, policy directory and database, waits until it
// accepts connections, and stops it with SIGINT when destroyed. Key
// administration runs PyKMIP's client through /usr/bin/python3 as one of the
// PKI's clients (a CN owns the objects it creates). Starting costs about a
// second, so share one server between related tests.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "tests/support/process.h"

namespace ZyrdTest {

// The source tree's root (for scripts the tests run).
std::filesystem::path SourceDir();

class TestPki {
 public:
  TestPki();  // aborts the test program if the certificates cannot be made
  const std::filesystem::path& dir() const { return dir_.path(); }
  std::filesystem::path Path(const std::string& name) const { return dir() / (name + ".pem"); }
  std::filesystem::path KeyPath(const std::string& name) const { return dir() / (name + ".key"); }
  std::string Pem(const std::string& name) const { return ReadTextFile(Path(name)); }
  std::string Key(const std::string& name) const { return ReadTextFile(KeyPath(name)); }

 private:
  TempDir dir_;
};

class PyKmipServer {
 public:
  explicit PyKmipServer(const TestPki& pki);
  ~PyKmipServer();
  PyKmipServer(const PyKmipServer&) = delete;
  PyKmipServer& operator=(const PyKmipServer&) = delete;

  // False when the server did not come up; error() says why.
  bool started() const { return started_; }
  const std::string& error() const { return error_; }
  uint16_t port() const { return port_; }
  std::string Log() const { return ReadTextFile(run_.path() / "server.log"); }

  // Runs admin commands in one client session (see pykmip_tool.py: "create
  // BITS", "activate ID", "revoke ID deactivated|compromised", "destroy ID",
  // "get ID", "state ID"; "$N" stands for the N-th output). Returns one output
  // per command, or an empty vector (and records error()) on failure.
  std::vector<std::string> Admin(const std::vector<std::vector<std::string>>& commands,
                                 const std::string& client = "client");

  // Convenience wrappers; an empty result means failure.
  std::string CreateKey(int bits, bool activate);
  bool Revoke(const std::string& id, const std::string& how);  // "deactivated"/"compromised"
  bool Destroy(const std::string& id);
  std::string KeyHex(const std::string& id);

  // Stops the server now (SIGINT, then SIGKILL after a grace period).
  void Stop();

 private:
  const TestPki& pki_;
  TempDir run_;
  uint16_t port_ = 0;
  bool started_ = false;
  std::string error_;
  std::unique_ptr<ChildProcess> process_;
};

}  // namespace ZyrdTest
