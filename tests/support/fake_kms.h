// A scriptable key server client and provider lookup for service tests,
// benchmarks and fuzzing. Not thread-safe: calls run one at a time.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "kms/kms.h"
#include "state/provider_lookup.h"

namespace ZyrdTest {

// Each server answers every key operation with its scripted result. The
// servers asked are recorded in order, with the key lengths generate asked
// for, and status updates are counted.
class FakeKms : public Zyrd::Kms::Kms {
 public:
  struct Server {
    std::string name;
    Zyrd::Kms::KmsResult generate = Zyrd::Kms::Ok;
    Zyrd::Kms::KmsResult decrypt = Zyrd::Kms::Ok;
    std::string reason = "scripted failure";
  };

  explicit FakeKms(std::vector<Server> servers) : servers_(std::move(servers)) {}

  uint32_t GetServerCount() override { return static_cast<uint32_t>(servers_.size()); }
  int GetServerName(uint32_t server, std::string& name) override {
    name = servers_.at(server).name;
    return 0;
  }
  Zyrd::Kms::KmsResult GenerateKey(uint32_t server, uint32_t keyLength,
                                   Groundwork::SecureString& plainKey, std::string& wrappedKey,
                                   std::string& reason) override {
    asked.push_back(server);
    keyLengths.push_back(keyLength);
    const Server& s = servers_.at(server);
    plainKey.assign("a2V5LWZyb20t" + s.name);
    wrappedKey = "wrapped-by-" + s.name;
    reason = s.reason;
    return s.generate;
  }
  Zyrd::Kms::KmsResult Decrypt(uint32_t server, const std::string& wrappedKey,
                               Groundwork::SecureString& plainKey, std::string& reason) override {
    asked.push_back(server);
    plainKey.assign("plain-of-" + wrappedKey);
    reason = servers_.at(server).reason;
    return servers_.at(server).decrypt;
  }
  void GetTrustedServerCertificates(std::vector<std::string>& certificates) override {
    certificates = trusted;
  }
  void GetClientCert(std::string& certificate) override { certificate = clientCert; }
  // The certificate in `presented` for the server, or OtherFailure when it
  // has none there.
  Zyrd::Kms::KmsResult GetRemoteServerCertificate(uint32_t server, std::string& pem,
                                                  std::string&) override {
    if (server >= presented.size() || presented[server].empty()) return Zyrd::Kms::OtherFailure;
    pem = presented[server];
    return Zyrd::Kms::Ok;
  }
  void UpdateStatus() override { ++updates; }
  void GetStatus(Zyrd::Kms::KmsStatus& out) override { out = status; }

  std::vector<uint32_t> asked;
  std::vector<uint32_t> keyLengths;
  int updates = 0;
  // Scripted trust material and status.
  std::vector<std::string> trusted;
  std::vector<std::string> presented;
  std::string clientCert;
  Zyrd::Kms::KmsStatus status;

 private:
  std::vector<Server> servers_;
};

class FakeProviders : public Zyrd::State::ProviderLookup {
 public:
  void Add(const std::string& name, std::shared_ptr<Zyrd::Kms::Kms> client) {
    clients_[name] = std::move(client);
  }
  std::shared_ptr<Zyrd::Kms::Kms> GetProvider(const std::string& name) override {
    ++lookups;
    auto it = clients_.find(name);
    return it == clients_.end() ? nullptr : it->second;
  }

  void DeleteProviderFromState(const std::string& name) override {
    clients_.erase(name);
    dropped.push_back(name);
  }
  void DeleteAllProvidersFromState() override {
    clients_.clear();
    dropped.push_back("*");
  }

  size_t lookups = 0;
  std::vector<std::string> dropped;  // names dropped, "*" for all

 private:
  std::map<std::string, std::shared_ptr<Zyrd::Kms::Kms>> clients_;
};

}  // namespace ZyrdTest
