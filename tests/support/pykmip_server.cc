#include "tests/support/pykmip_server.h"

#include <signal.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <sstream>
#include <thread>

namespace ZyrdTest {
namespace {

const char* kPython = "/usr/bin/python3";
const char* kServer = "/usr/bin/pykmip-server";

std::string Tool() { return (SourceDir() / "tools/pykmip_tool.py").string(); }

}  // namespace

std::filesystem::path SourceDir() { return ZYRD_SOURCE_DIR; }

TestPki::TestPki() {
  std::string out, err;
  if (RunProcess({kPython, Tool(), "pki", dir().string()}, &out, &err) != 0) {
    std::fprintf(stderr, "cannot make the test PKI: %s\n", err.c_str());
    std::abort();
  }
}

PyKmipServer::PyKmipServer(const TestPki& pki) : pki_(pki) {
  for (int attempt = 0; attempt < 3 && !started_; ++attempt) {
    port_ = FreeLoopbackPort();
    std::string out, err;
    if (RunProcess({kPython, Tool(), "config", pki_.dir().string(), std::to_string(port_),
                    run_.path().string()},
                   &out, &err) != 0) {
      error_ = "cannot write the server configuration: " + err;
      return;
    }
    process_ = std::make_unique<ChildProcess>(
        std::vector<std::string>{kServer, "-f", (run_.path() / "server.conf").string(), "-l",
                                 (run_.path() / "server.log").string()},
        (run_.path() / "server.out").string());
    auto until = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (std::chrono::steady_clock::now() < until && process_->Running()) {
      if (AcceptsConnections(port_)) {
        started_ = true;
        break;
      }
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    if (!started_) {
      error_ = "the server did not start; its output:\n" +
               ReadTextFile(run_.path() / "server.out") + Log();
      process_->Stop(SIGKILL, std::chrono::milliseconds(2000));
    }
  }
}

PyKmipServer::~PyKmipServer() { Stop(); }

void PyKmipServer::Stop() {
  if (process_) process_->Stop(SIGINT, std::chrono::milliseconds(10000));
  process_.reset();
}

std::vector<std::string> PyKmipServer::Admin(const std::vector<std::vector<std::string>>& commands,
                                             const std::string& client) {
  std::vector<std::string> argv = {
      kPython, Tool(), "admin", pki_.dir().string(), std::to_string(port_), "--client", client};
  for (size_t i = 0; i < commands.size(); ++i) {
    if (i > 0) argv.push_back("--");
    argv.insert(argv.end(), commands[i].begin(), commands[i].end());
  }
  std::string out, err;
  if (RunProcess(argv, &out, &err) != 0) {
    error_ = "admin command failed: " + err;
    return {};
  }
  std::vector<std::string> lines;
  std::istringstream in(out);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  if (lines.size() != commands.size()) {
    error_ = "admin printed " + std::to_string(lines.size()) + " lines";
    return {};
  }
  return lines;
}

std::string PyKmipServer::CreateKey(int bits, bool activate) {
  std::vector<std::vector<std::string>> commands = {{"create", std::to_string(bits)}};
  if (activate) commands.push_back({"activate", "$1"});
  std::vector<std::string> out = Admin(commands);
  return out.empty() ? std::string() : out[0];
}

bool PyKmipServer::Revoke(const std::string& id, const std::string& how) {
  return !Admin({{"revoke", id, how}}).empty();
}

bool PyKmipServer::Destroy(const std::string& id) { return !Admin({{"destroy", id}}).empty(); }

std::string PyKmipServer::KeyHex(const std::string& id) {
  std::vector<std::string> out = Admin({{"get", id}});
  return out.empty() ? std::string() : out[0];
}

}  // namespace ZyrdTest
