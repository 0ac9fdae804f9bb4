// A scriptable key server client and provider lookup for service tests.
#pragma once

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "kms/kms.h"
#include "state/provider_lookup.h"

namespace ZyrdTest {

// Each server answers every key operation with its scripted result; the
// servers that were asked are recorded in order, status updates counted.
class FakeKms : public Zyrd::Kms::Kms {
 public:
  struct Server {
    std::string name;
    Zyrd::Kms::KmsResult generate = Zyrd::Kms::Ok;
    Zyrd::Kms::KmsResult decrypt = Zyrd::Kms::Ok;
    std::string reason = "scripted failure";
  };

  explicit FakeKms(std::vector<Server> servers) : servers_(std::move(servers)) {}

  std::vector<uint32_t> Asked() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return asked_;
  }
  // Key lengths generate_key asked for.
  std::vector<uint32_t> KeyLengths() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return keyLengths_;
  }

  uint32_t GetServerCount() override { return static_cast<uint32_t>(servers_.size()); }
  int GetServerName(uint32_t server, std::string& name) override {
    name = servers_.at(server).name;
    return 0;
  }
  Zyrd::Kms::KmsResult GenerateKey(uint32_t server, uint32_t keyLength,
                                   Groundwork::SecureString& plainKey, std::string& wrappedKey,
                                   std::string& reason) override {
    Note(server, keyLength);
    const Server& s = servers_.at(server);
    if (s.generate != Zyrd::Kms::Ok) {
      reason = s.reason;
      return s.generate;
    }
    plainKey.assign("a2V5LWZyb20t" + s.name);
    wrappedKey = "wrapped-by-" + s.name;
    return Zyrd::Kms::Ok;
  }
  Zyrd::Kms::KmsResult Decrypt(uint32_t server, const std::string& wrappedKey,
                               Groundwork::SecureString& plainKey, std::string& reason) override {
    Note(server, 0);
    const Server& s = servers_.at(server);
    if (s.decrypt != Zyrd::Kms::Ok) {
      reason = s.reason;
      return s.decrypt;
    }
    plainKey.assign("plain-of-" + wrappedKey);
    return Zyrd::Kms::Ok;
  }
  void GetTrustedServerCertificates(std::vector<std::string>&) override {}
  void GetClientCert(std::string&) override {}
  Zyrd::Kms::KmsResult GetRemoteServerCertificate(uint32_t, std::string&, std::string&) override {
    return Zyrd::Kms::OtherFailure;
  }
  void UpdateStatus() override { ++updates; }
  void GetStatus(Zyrd::Kms::KmsStatus&) override {}

 private:
  void Note(uint32_t server, uint32_t keyLength) {
    std::lock_guard<std::mutex> lock(mutex_);
    asked_.push_back(server);
    if (keyLength != 0) keyLengths_.push_back(keyLength);
  }

  std::vector<Server> servers_;
  mutable std::mutex mutex_;
  std::vector<uint32_t> asked_;
  std::vector<uint32_t> keyLengths_;

 public:
  std::atomic<int> updates{0};
};

class FakeProviders : public Zyrd::State::ProviderLookup {
 public:
  void Add(const std::string& name, std::shared_ptr<Zyrd::Kms::Kms> client) {
    std::lock_guard<std::mutex> lock(mutex_);
    clients_[name] = std::move(client);
  }
  size_t Lookups() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return lookups_;
  }
  std::shared_ptr<Zyrd::Kms::Kms> GetProvider(const std::string& name) override {
    std::lock_guard<std::mutex> lock(mutex_);
    ++lookups_;
    auto it = clients_.find(name);
    return it == clients_.end() ? nullptr : it->second;
  }

 private:
  mutable std::mutex mutex_;
  std::map<std::string, std::shared_ptr<Zyrd::Kms::Kms>> clients_;
  size_t lookups_ = 0;
};

}  // namespace ZyrdTest
