#include "platform/http/server_config.h"

#include <string>

namespace Lumo::Transport {

std::string EndpointToString(const boost::asio::ip::tcp::endpoint& endpoint) {
  const auto address = endpoint.address();
  std::string port = std::to_string(endpoint.port());
  if (address.is_v6()) return "[" + address.to_string() + "]:" + port;
  return address.to_string() + ":" + port;
}

std::string DurationToString(std::chrono::nanoseconds duration) {
  const int64_t ns = duration.count();
  if (ns < 1'000) return std::to_string(ns) + " nanoseconds";
  if (ns < 1'000'000) return std::to_string(ns / 1'000) + " microseconds";
  if (ns < 1'000'000'000) return std::to_string(ns / 1'000'000) + " milliseconds";
  const int64_t seconds = ns / 1'000'000'000;
  if (seconds < 60) return std::to_string(seconds) + " seconds";
  return std::to_string(seconds / 60) + " minutes and " + std::to_string(seconds % 60) + " seconds";
}

std::string ToString(const ServerConfig& config) {
  std::string text = "ServerConfig{";
  if (config.listenOnAllInterfaces) {
    text += "port:" + std::to_string(config.port);
  } else {
    text += "endpoint4:" + EndpointToString(config.endpoint4);
    text += ";endpoint6:" + EndpointToString(config.endpoint6);
  }
  if (!config.localizer) text += ";Localizer not set";
  text += ";readTimeout:" + DurationToString(config.readTimeout);
  text += ";writeTimeout:" + DurationToString(config.writeTimeout);
  text += ";httpBodySizeLimitInBytes:" + std::to_string(config.httpBodySizeLimitInBytes);
  text += ";ProtocolHandlerSpec::extractors ";
  const auto& extractors = config.protocolHandlerSpec.extractors;
  text += extractors ? "count:" + std::to_string(extractors->size()) : std::string("not set");
  text += "}";
  return text;
}

}  // namespace Lumo::Transport
