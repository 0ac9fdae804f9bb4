// The providers service "com.tarsel.orna.kms.providers": its request records,
// the wire form of the provider records, its interface and its binder.
//
//   list()                          -> list of Summary
//   create(spec: CreateSpec)        -> nothing
//   update(provider, spec: UpdateSpec) -> nothing
//   delete(provider)                -> nothing
//   get(provider)                   -> Info
//
// The result records (Summary, Info and what they hold) are the
// configuration layer's (config/provider_records.h).
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <boost/json/value_to.hpp>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "config/provider_records.h"
#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"

namespace Com::Tarsel::Orna::Kms::ProvidersSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.providers";

// Ports used when a request leaves one unset.
inline constexpr int64_t kDefaultKmipPort = 5696;
inline constexpr int64_t kDefaultProxyPort = 443;

struct KmipServerCreateSpec {
  std::vector<Server> servers;
  std::optional<std::string> username;
};

struct KeyServerCreateSpec {
  KeyServerType type;
  std::optional<std::string> description;
  std::optional<NetworkAddress> proxyServer;
  std::optional<int64_t> connectionTimeout;  // seconds
  KmipServerCreateSpec kmipServer;
};

struct CreateSpec {
  std::string provider;
  std::string masterKeyId;
  KeyServerCreateSpec keyServer;
};

struct KmipServerUpdateSpec {
  std::optional<std::vector<Server>> servers;  // replaces the whole list
  std::optional<std::string> username;
};

struct KeyServerUpdateSpec {
  std::optional<KeyServerType> type;
  std::optional<std::string> description;
  std::optional<NetworkAddress> proxyServer;  // an empty hostname removes the proxy
  std::optional<int64_t> connectionTimeout;
  std::optional<KmipServerUpdateSpec> kmipServer;
};

struct UpdateSpec {
  std::optional<std::string> masterKeyId;
  std::optional<KeyServerUpdateSpec> keyServer;
};

// Wire form: the type is its text ("KMIP", or the open form's text).
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const KeyServerType& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const NetworkAddress& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Server& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const KmipServerInfo& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const KeyServerInfo& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Info& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const Summary& in);

KeyServerType tag_invoke(boost::json::value_to_tag<KeyServerType>, const boost::json::value& in);
NetworkAddress tag_invoke(boost::json::value_to_tag<NetworkAddress>, const boost::json::value& in);
Server tag_invoke(boost::json::value_to_tag<Server>, const boost::json::value& in);
KmipServerCreateSpec tag_invoke(boost::json::value_to_tag<KmipServerCreateSpec>,
                                const boost::json::value& in);
KeyServerCreateSpec tag_invoke(boost::json::value_to_tag<KeyServerCreateSpec>,
                               const boost::json::value& in);
CreateSpec tag_invoke(boost::json::value_to_tag<CreateSpec>, const boost::json::value& in);
KmipServerUpdateSpec tag_invoke(boost::json::value_to_tag<KmipServerUpdateSpec>,
                                const boost::json::value& in);
KeyServerUpdateSpec tag_invoke(boost::json::value_to_tag<KeyServerUpdateSpec>,
                               const boost::json::value& in);
UpdateSpec tag_invoke(boost::json::value_to_tag<UpdateSpec>, const boost::json::value& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;

  // Each operation completes its result exactly once. `delete_` serves the
  // operation "delete".
  virtual void list(::Lumo::AsyncResult<std::vector<Summary>> result) = 0;
  virtual void create(const CreateSpec& spec, ::Lumo::AsyncResult<void> result) = 0;
  virtual void update(const std::string& provider, const UpdateSpec& spec,
                      ::Lumo::AsyncResult<void> result) = 0;
  virtual void delete_(const std::string& provider, ::Lumo::AsyncResult<void> result) = 0;
  virtual void get(const std::string& provider, ::Lumo::AsyncResult<Info> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::ProvidersSvc
