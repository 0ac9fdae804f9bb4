#include "platform/http/listener.h"

#include <boost/asio/dispatch.hpp>
#include <boost/asio/error.hpp>
#include <boost/asio/ip/v6_only.hpp>
#include <boost/asio/socket_base.hpp>

#include "platform/http/server_config.h"

namespace Lumo::Transport::PicoHttp {
namespace {

namespace asio = boost::asio;
using asio::ip::tcp;
using boost::system::error_code;

constexpr int kBacklog = 128;

}  // namespace

bool IsDelayAcceptError(const error_code& ec) {
  // Running out of descriptors (ours or the system's) or of kernel memory
  // passes once connections close; it must not end the listener for good.
  return ec == asio::error::no_descriptors || ec == asio::error::no_buffer_space ||
         ec == asio::error::no_memory ||
         (ec.category() == boost::system::system_category() && ec.value() == ENFILE);
}

Listener::Listener(asio::io_context& io, std::string family, std::shared_ptr<Log::Logger> logger,
                   AcceptCallback onAccept)
    : io_(io),
      strand_(asio::make_strand(io)),
      acceptor_(strand_),
      delay_(strand_),
      family_(std::move(family)),
      logger_(std::move(logger)),
      onAccept_(std::move(onAccept)) {}

error_code Listener::Open(const tcp::endpoint& endpoint) {
  error_code ec;
  if (acceptor_.is_open()) {
    ec = asio::error::already_open;
  } else {
    acceptor_.open(endpoint.protocol(), ec);
    if (!ec) acceptor_.set_option(asio::socket_base::reuse_address(true), ec);
    if (!ec && endpoint.address().is_v6()) acceptor_.set_option(asio::ip::v6_only(true), ec);
    if (!ec) acceptor_.bind(endpoint, ec);
    if (!ec) acceptor_.listen(kBacklog, ec);
    if (!ec) endpoint_ = acceptor_.local_endpoint(ec);
    if (ec) {
      error_code ignored;
      acceptor_.close(ignored);
    }
  }
  if (ec) {
    LUMO_LOG(logger_, Log::kInfo) << family_
                                  << " Failed to listen on: " << EndpointToString(endpoint)
                                  << " ec: " << ec.category().name() << ":" << ec.value() << "\n";
    return ec;
  }
  LUMO_LOG(logger_, Log::kInfo) << "Listening on: " << EndpointToString(endpoint_) << "\n";
  closed_ = false;
  asio::dispatch(strand_, [self = shared_from_this()] { self->Accept(); });
  return {};
}

void Listener::Close() {
  closed_ = true;
  error_code ignored;
  delay_.cancel();
  acceptor_.close(ignored);
}

void Listener::Accept() {
  if (closed_) return;
  acceptor_.async_accept(asio::make_strand(io_),
                         [self = shared_from_this()](const error_code& ec, tcp::socket socket) {
                           self->OnAccept(ec, std::move(socket));
                         });
}

void Listener::OnAccept(const error_code& ec, tcp::socket socket) {
  if (!ec) {
    onAccept_(std::move(socket));
    Accept();
    return;
  }
  if (closed_ || ec == asio::error::operation_aborted) return;

  const bool delay = IsDelayAcceptError(ec);
  LUMO_LOG(logger_, Log::kError) << "Accept Error: " << ec.message()
                                 << (delay ? ";DelayAcceptError" : ";TerminalAcceptError")
                                 << ".Acceptor info:" << family_ << " "
                                 << EndpointToString(endpoint_) << "\n";
  if (!delay) return;  // this listener stops; the other one and open connections go on
  delay_.expires_after(kAcceptRetryDelay);
  delay_.async_wait([self = shared_from_this()](const error_code& timerError) {
    if (self->closed_ || timerError == asio::error::operation_aborted) return;
    if (timerError) {
      LUMO_LOG(self->logger_, Log::kError)
          << "Delay timer Accept Error:" << timerError.message() << "\n";
    }
    self->Accept();
  });
}

}  // namespace Lumo::Transport::PicoHttp
