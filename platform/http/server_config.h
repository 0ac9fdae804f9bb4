// Settings of the HTTP server: where it listens, its deadlines and limits, and
// the one-line description it logs when it is built.
#pragma once

#include <boost/asio/ip/tcp.hpp>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/lumo/localizer.h"
#include "platform/lumo/log.h"

namespace Lumo::Transport {

// "127.0.0.1:7888", "[::1]:7888".
std::string EndpointToString(const boost::asio::ip::tcp::endpoint& endpoint);

// A duration as a whole number in the largest fitting unit: "999 nanoseconds",
// "5 microseconds", "250 milliseconds", "59 seconds", "20 minutes and 0 seconds".
std::string DurationToString(std::chrono::nanoseconds duration);

// Settings handed to the JSON-RPC protocol handler.
struct ProtocolHandlerSpec {
  // Null: the framework's default localizer.
  std::shared_ptr<const L10n::Localizer> localizer;
  // Names of extra request headers handed to the handler; unset when none.
  std::optional<std::vector<std::string>> extractors;
  // A request whose declared length is above this is refused as too large.
  uint64_t maxRequestSize = 2'500'000;
};

struct ServerConfig {
  // When set, both listeners bind the wildcard address of their family on
  // `port` instead of endpoint4 and endpoint6.
  bool listenOnAllInterfaces = false;
  uint16_t port = 0;
  boost::asio::ip::tcp::endpoint endpoint4;
  boost::asio::ip::tcp::endpoint endpoint6;

  // Transport messages; may be null (then nothing is logged).
  std::shared_ptr<Log::Logger> logger;
  std::shared_ptr<const L10n::Localizer> localizer;

  // Longest wait for the next part of a request (also between requests on a
  // kept-alive connection), and for one response write to complete.
  std::chrono::nanoseconds readTimeout = std::chrono::seconds(1200);
  std::chrono::nanoseconds writeTimeout = std::chrono::seconds(1800);
  uint64_t httpBodySizeLimitInBytes = 2'500'000;
  ProtocolHandlerSpec protocolHandlerSpec;

  // Not part of the logged description: how long a connection that is being
  // closed after an error response keeps draining what its peer still sends
  // (so the peer reads the response instead of a reset), and how much.
  std::chrono::nanoseconds lingerTimeout = std::chrono::seconds(2);
  uint64_t lingerMaxBytes = 8u << 20;

  // Not logged either. Longest time from the first byte of a request to its
  // last (head and body): readTimeout alone restarts with every byte, so a
  // peer sending one byte at a time could hold a connection for ever.
  std::chrono::nanoseconds requestTimeout = std::chrono::seconds(20);
  // Most connections open at once. One more closes the connection that has
  // waited longest for a request head, or, when none waits, is closed itself.
  size_t maxConnections = 1024;
};

// "ServerConfig{endpoint4:127.0.0.1:7888;endpoint6:[::1]:7888;Localizer not
// set;readTimeout:20 minutes and 0 seconds;...}".
std::string ToString(const ServerConfig& config);

}  // namespace Lumo::Transport
