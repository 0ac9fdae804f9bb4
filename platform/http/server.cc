#include "platform/http/server.h"

namespace Lumo::Transport::PicoHttp {

namespace asio = boost::asio;
using asio::ip::tcp;

namespace {

void StartSession(tcp::socket socket, std::shared_ptr<const ServerContext> context) {
  std::make_shared<Session>(std::move(socket), std::move(context))->Start();
}

}  // namespace

Server::Server(asio::io_context& io, ServerConfig config, HttpCallHandler handler) {
  auto connections = std::make_shared<Connections>(config.maxConnections);
  context_ = std::make_shared<const ServerContext>(
      ServerContext{std::move(config), std::move(handler), std::move(connections)});
  const auto& logger = context_->config.logger;
  LUMO_LOG(logger, Log::kInfo) << ToString(context_->config) << "\n";
  // The listeners hold the context, not the server, so a connection accepted
  // while the server goes away still finds everything it needs.
  auto serve = [context = context_](tcp::socket socket) {
    StartSession(std::move(socket), context);
  };
  listener4_ = std::make_shared<Listener>(io, "IPv4", logger, serve);
  listener6_ = std::make_shared<Listener>(io, "IPv6", logger, serve);
}

Server::~Server() { Close(); }

Server::ListenResult Server::Listen() {
  const ServerConfig& config = context_->config;
  tcp::endpoint endpoint4 = config.endpoint4;
  tcp::endpoint endpoint6 = config.endpoint6;
  if (config.listenOnAllInterfaces) {
    endpoint4 = tcp::endpoint(asio::ip::address_v4::any(), config.port);
    endpoint6 = tcp::endpoint(asio::ip::address_v6::any(), config.port);
  }
  ListenResult result;
  result.ipv4 = listener4_->Open(endpoint4);
  if (!result.ipv4 && endpoint4.port() == 0 && endpoint6.port() == 0) {
    endpoint6.port(listener4_->LocalEndpoint().port());
  }
  result.ipv6 = listener6_->Open(endpoint6);
  return result;
}

void Server::Serve(tcp::socket socket) { StartSession(std::move(socket), context_); }

void Server::Close() {
  listener4_->Close();
  listener6_->Close();
}

}  // namespace Lumo::Transport::PicoHttp
