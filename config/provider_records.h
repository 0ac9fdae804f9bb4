// The providers API's view of a provider, as the configuration store layer
// reads it and the providers service returns it.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace Com::Tarsel::Orna::Kms::ProvidersSvc {

// Key server type: KMIP is the one defined value; any other text is carried
// in the open form.
struct KeyServerType {
  enum Value : int { KMIP = 0, OPEN = 1 };
  Value value = KMIP;
  std::string text = "KMIP";  // the stored or given text

  static KeyServerType Kmip() { return {KMIP, "KMIP"}; }
  static KeyServerType Open(std::string text) { return {OPEN, std::move(text)}; }
  bool operator==(const KeyServerType&) const = default;
};

struct NetworkAddress {
  std::string hostname;
  std::optional<int64_t> port;
  bool operator==(const NetworkAddress&) const = default;
};

struct Server {
  std::string name;
  NetworkAddress address;
  bool operator==(const Server&) const = default;
};

struct KmipServerInfo {
  std::vector<Server> servers;  // in store order
  std::optional<std::string> username;
  bool operator==(const KmipServerInfo&) const = default;
};

struct KeyServerInfo {
  KeyServerType type;
  std::string description;  // empty when absent
  std::optional<NetworkAddress> proxyServer;
  std::optional<int64_t> connectionTimeout;  // seconds
  KmipServerInfo kmipServer;
  bool operator==(const KeyServerInfo&) const = default;
};

struct Info {
  std::string masterKeyId;
  KeyServerInfo keyServer;
  bool operator==(const Info&) const = default;
};

struct Summary {
  std::string provider;
  bool operator==(const Summary&) const = default;
};

}  // namespace Com::Tarsel::Orna::Kms::ProvidersSvc
