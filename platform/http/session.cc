#include "platform/http/session.h"


#include <openssl/crypto.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <boost/asio/dispatch.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/write.hpp>
#include <boost/beast/http/error.hpp>

#include "platform/http/response.h"
#include "platform/lumo/log.h"
#include "platform/util/ascii.h"

namespace Lumo::Transport::PicoHttp {
namespace {

namespace asio = boost::asio;
namespace beast = boost::beast;
namespace http = beast::http;
using boost::system::error_code;

constexpr size_t kReadChunk = 64 * 1024;
constexpr std::string_view kChunkEnd = "\r\n";
constexpr std::string_view kLastChunk = "0\r\n\r\n";

// Calls carry the bearer token and the request body; both are wiped when the
// last holder lets go of the call.
void DeleteCall(HttpCall* call) {
  WipeString(call->authorization);
  WipeString(call->body);
  delete call;
}

// Keeps header values free of line breaks and other control characters.
std::string HeaderSafe(std::string text) {
  std::erase_if(text, [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; });
  return text;
}

}  // namespace

// The completion handed to the call handler. The handler completes it once,
// on any thread; the result is then written on the session's strand. A second
// completion is ignored, and a completion that is dropped without being called
// answers the request with the internal server error, so a connection never
// hangs on a lost result.
class Session::Completion {
 public:
  explicit Completion(std::shared_ptr<Session> session) : session_(std::move(session)) {}
  ~Completion() {
    if (!done_.exchange(true)) {
      LUMO_LOG(session_->Logger(), Log::kTrace)
          << "Handle request error: [" << session_->peer_ << "] the call was never completed\n";
      Deliver(InternalServerErrorResult());
    }
  }
  Completion(const Completion&) = delete;
  Completion& operator=(const Completion&) = delete;

  void Complete(HttpCallResult result) {
    if (done_.exchange(true)) {
      LUMO_LOG(session_->Logger(), Log::kError)
          << "Handle request error: [" << session_->peer_ << "] the call was completed twice\n";
      WipeString(result.body);
      return;
    }
    Deliver(std::move(result));
  }

 private:
  void Deliver(HttpCallResult result) {
    asio::dispatch(session_->stream_.get_executor(),
                   [session = session_, result = std::move(result)]() mutable {
                     session->WriteResult(std::move(result));
                   });
  }

  std::shared_ptr<Session> session_;
  std::atomic<bool> done_{false};
};

std::shared_ptr<Session> Connections::Open(const std::shared_ptr<Session>& session) {
  std::lock_guard<std::mutex> lock(mutex_);
  session->counted_ = true;
  if (++open_ <= max_) return nullptr;
  while (!waiting_.empty()) {
    Session* oldest = waiting_.front();
    waiting_.pop_front();
    oldest->waitingAt_.reset();
    // One that is being destroyed (its destructor waits for the lock) closes
    // by itself; the next one is chosen.
    if (auto victim = oldest->weak_from_this().lock()) return victim;
  }
  return session;
}

void Connections::StopWaiting(Session& session) {
  if (session.waitingAt_) waiting_.erase(*session.waitingAt_);
  session.waitingAt_.reset();
}

void Connections::Closed(Session& session) {
  std::lock_guard<std::mutex> lock(mutex_);
  StopWaiting(session);
  if (session.counted_) --open_;
}

void Connections::Waiting(Session& session) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!session.waitingAt_) session.waitingAt_ = waiting_.insert(waiting_.end(), &session);
}

void Connections::Busy(Session& session) {
  std::lock_guard<std::mutex> lock(mutex_);
  StopWaiting(session);
}

Session::Session(asio::ip::tcp::socket socket, std::shared_ptr<const ServerContext> context)
    : stream_(std::move(socket)), context_(std::move(context)), buffer_(kMaxHeadBytes) {
  error_code ec;
  auto remote = stream_.socket().remote_endpoint(ec);
  peer_ = ec ? std::string("unknown") : EndpointToString(remote);
}

Session::~Session() {
  context_->connections->Closed(*this);
  auto readable = buffer_.data();
  OPENSSL_cleanse(readable.data(), readable.size());
  WipeString(responseBody_);
}

void Session::Start() {
  auto self = shared_from_this();
  auto closing = context_->connections->Open(self);
  if (closing == self) {
    // Every open connection is busy with a request: this one is closed as
    // the last owner lets go of the session.
    LUMO_LOG(Logger(), Log::kInfo)
        << "Connection limit reached: closing the new connection [" << peer_ << "]\n";
    return;
  }
  if (closing) closing->Evict();
  asio::dispatch(stream_.get_executor(), [self] { self->BeginRequest(); });
}

void Session::Evict() {
  asio::post(stream_.get_executor(), [self = shared_from_this()] {
    if (!self->awaitingHead_) return;  // a request has arrived meanwhile
    LUMO_LOG(self->Logger(), Log::kInfo)
        << "Connection limit reached: closing the connection waiting longest for a request ["
        << self->peer_ << "]\n";
    self->Close();
  });
}

std::string_view Session::Buffered() const {
  auto readable = buffer_.data();
  return {static_cast<const char*>(readable.data()), readable.size()};
}

// Parsed bytes can hold a token or key material: they are overwritten before
// the buffer reuses their space.
void Session::Consume(size_t n) {
  if (n == 0) return;
  OPENSSL_cleanse(buffer_.data().data(), n);
  buffer_.consume(n);
}

void Session::Read(Step next, bool inBody) {
  const size_t room = std::min(kReadChunk, buffer_.max_size() - buffer_.size());
  if (room == 0) {  // the parsers bound what they leave buffered; never read nothing
    FailRequest("lumo.recv.failed", MakeErrorCode(HttpError::kProtocol));
    Close();
    return;
  }
  std::chrono::steady_clock::time_point expiry =
      std::chrono::steady_clock::now() + context_->config.readTimeout;
  if (requestDeadline_) expiry = std::min(expiry, *requestDeadline_);
  stream_.expires_at(expiry);
  stream_.async_read_some(buffer_.prepare(room),
                          [self = shared_from_this(), next, inBody](error_code ec, size_t n) {
                            if (ec) {
                              // A peer that goes away between requests, or a head that never
                              // completes, ends the connection without a response.
                              if (inBody) self->FailRequest("lumo.recv.failed", ec);
                              self->Close();
                              return;
                            }
                            self->buffer_.commit(n);
                            ((*self).*next)();
                          });
}

void Session::BeginRequest() {
  head_.emplace(kMaxHeadBytes, context_->config.httpBodySizeLimitInBytes);
  requestDeadline_.reset();
  awaitingHead_ = true;
  context_->connections->Waiting(*this);
  ParseHead();
}

void Session::ParseHead() {
  if (!requestDeadline_ && buffer_.size() > 0) {
    requestDeadline_ = std::chrono::steady_clock::now() + context_->config.requestTimeout;
  }
  size_t consumed = 0;
  const auto status = head_->Parse(Buffered(), &consumed);
  Consume(consumed);
  switch (status) {
    case RequestHeadParser::Status::kIncomplete:
      Read(&Session::ParseHead, false);
      return;
    case RequestHeadParser::Status::kBad:
      LUMO_LOG(Logger(), Log::kInfo) << "Invalid Http request\n";
      WriteAndLinger(std::string(kCanned400));
      return;
    case RequestHeadParser::Status::kComplete:
      OnHead();
      return;
  }
}

void Session::OnHead() {
  awaitingHead_ = false;
  context_->connections->Busy(*this);
  const RequestFacts& facts = head_->Facts();
  LUMO_LOG(Logger(), Log::kTrace) << "Request head: [" << peer_ << "]\n";

  if (facts.expect && !facts.expectContinue) {
    LUMO_LOG(Logger(), Log::kInfo)
        << "Invalid Http request: Expect header value is not 100-continue\n";
    WriteAndLinger(std::string(kCanned417));
    return;
  }

  // The protocol handler takes plain JSON-RPC only: a JSON request
  // deserializer exists for "application/json" alone, and framed or streamed
  // requests are not supported.
  const auto& spec = context_->config.protocolHandlerSpec;
  const bool bad = facts.contentTypeCode != kJson;
  if (bad || facts.framedOrStreamed) {
    LUMO_LOG(Logger(), Log::kDebug)
        << (bad ? "Request is considered as bad\n" : "Request is framed. Not supported\n");
    if (facts.contentTypeCode == 0) {
      Refuse("invalid_content_type", "lumo.invalid.content.type");
    } else if (facts.contentLength && *facts.contentLength > spec.maxRequestSize) {
      Refuse("request_exceeds_max_size", "lumo.request.exceeds.max.size");
    } else {
      Refuse("invalid_request", "lumo.invalid.request");
    }
    return;
  }
  if (head_->DeclaredBodyTooLarge()) {
    Refuse("request_exceeds_max_size", "lumo.request.exceeds.max.size");
    return;
  }

  if (facts.expectContinue && !head_->Parser().is_done()) {
    Write(asio::buffer(kContinue.data(), kContinue.size()), &Session::ReadBody);
    return;
  }
  ReadBody();
}

void Session::ReadBody() {
  RequestParser& parser = head_->Parser();
  while (!parser.is_done()) {
    if (buffer_.size() == 0) {
      Read(&Session::ReadBody, true);
      return;
    }
    beast::error_code ec;
    const size_t n = head_->PutBody(buffer_.data(), ec);
    Consume(n);
    if (ec == http::error::body_limit) {
      Refuse("request_exceeds_max_size", "lumo.request.exceeds.max.size");
      return;
    }
    if (ec == http::error::need_more || (!ec && n == 0)) {
      if (buffer_.size() >= buffer_.max_size()) {
        FailRequest("lumo.recv.failed", MakeErrorCode(HttpError::kChunkParse));
        Close();
        return;
      }
      Read(&Session::ReadBody, true);
      return;
    }
    if (ec) {
      FailRequest("lumo.recv.failed", MakeErrorCode(HttpError::kChunkParse));
      Close();
      return;
    }
  }
  Dispatch();
}

void Session::Dispatch() {
  const RequestFacts& facts = head_->Facts();
  auto& message = head_->Parser().get();
  std::shared_ptr<HttpCall> call(new HttpCall(), DeleteCall);
  call->peer = peer_;
  for (auto& field : message) {
    std::string_view name(field.name_string());
    std::string_view value(field.value());
    if (call->authorization.empty() && Groundwork::AsciiIEquals(name, "authorization")) {
      call->authorization.assign(value);
      // The parsed head belongs to this session: overwrite its copy of the token.
      OPENSSL_cleanse(const_cast<char*>(value.data()), value.size());
    } else if (call->acceptLanguage.empty() && Groundwork::AsciiIEquals(name, "accept-language")) {
      call->acceptLanguage.assign(value);
    }
  }
  call->responseCode = facts.responseCode;
  call->body = std::move(message.body());
  WipeString(message.body());

  keepAlive_ = facts.keepAlive;
  streamed_ = facts.streamedResponse;
  responseCode_ = facts.responseCode;
  head_.reset();

  LUMO_LOG(Logger(), Log::kDebug) << "Request received[" << peer_ << "]\n";
  auto completion = std::make_shared<Completion>(shared_from_this());
  try {
    context_->handler(std::move(call), [completion](HttpCallResult result) {
      completion->Complete(std::move(result));
    });
  } catch (const std::exception& e) {
    LUMO_LOG(Logger(), Log::kTrace)
        << "Handle request error: [" << peer_ << "] " << e.what() << "\n";
    completion->Complete(InternalServerErrorResult());
  } catch (...) {
    LUMO_LOG(Logger(), Log::kTrace) << "Handle request error: [" << peer_ << "] unknown error\n";
    completion->Complete(InternalServerErrorResult());
  }
}

void Session::WriteResult(HttpCallResult result) {
  responseBody_ = std::move(result.body);
  WipeString(result.body);
  lumoError_ = HeaderSafe(std::move(result.errorName));
  ResponseHead head;
  if (!streamed_) head.contentLength = responseBody_.size();
  head.contentType = ContentTypeForResponseCode(responseCode_);
  head.keepAlive = keepAlive_;
  head.lumoError = lumoError_;
  responseHead_ = FormatResponseHead(head);

  stream_.expires_after(context_->config.writeTimeout);
  if (!streamed_) {
    std::array<asio::const_buffer, 2> buffers{asio::buffer(responseHead_),
                                              asio::buffer(responseBody_)};
    asio::async_write(stream_, buffers, [self = shared_from_this()](error_code ec, size_t) {
      if (ec) {
        LUMO_LOG(self->Logger(), Log::kWarning)
            << "Failed to deliver response. EC:" << ec.message() << "\n";
        self->Close();
        return;
      }
      self->OnResponseWritten();
    });
    return;
  }

  asio::async_write(
      stream_, asio::buffer(responseHead_), [self = shared_from_this()](error_code ec, size_t) {
        if (ec) {
          LUMO_LOG(self->Logger(), Log::kWarning) << "Failed to sent response head\n";
          self->Close();
          return;
        }
        self->chunkLines_ = ChunkSizeLines(self->responseBody_.size());
        std::vector<asio::const_buffer> buffers;
        buffers.reserve(self->chunkLines_.size() * 3 + 1);
        for (size_t i = 0; i < self->chunkLines_.size(); ++i) {
          const size_t offset = i * kMaxChunkSize;
          buffers.push_back(asio::buffer(self->chunkLines_[i]));
          buffers.push_back(
              asio::buffer(self->responseBody_.data() + offset,
                           std::min(kMaxChunkSize, self->responseBody_.size() - offset)));
          buffers.push_back(asio::buffer(kChunkEnd.data(), kChunkEnd.size()));
        }
        buffers.push_back(asio::buffer(kLastChunk.data(), kLastChunk.size()));
        self->stream_.expires_after(self->context_->config.writeTimeout);
        asio::async_write(self->stream_, buffers, [self](error_code ec, size_t) {
          if (ec) {
            LUMO_LOG(self->Logger(), Log::kWarning) << "Failed to sent response body\n";
            self->Close();
            return;
          }
          self->OnResponseWritten();
        });
      });
}

void Session::OnResponseWritten() {
  WipeString(responseBody_);
  LUMO_LOG(Logger(), Log::kTrace) << "Request handled[" << peer_ << "]\n";
  if (keepAlive_) {
    BeginRequest();
    return;
  }
  error_code ignored;
  stream_.socket().shutdown(asio::ip::tcp::socket::shutdown_send, ignored);
  Close();
}

void Session::Refuse(std::string_view name, std::string_view messageId) {
  const auto& contentType = head_->Facts().contentType;
  std::string body = RefusalBody(name, messageId, contentType ? *contentType : "");
  ResponseHead head;
  head.status = 400;
  head.reason = "Bad Request";
  head.contentLength = body.size();
  head.contentType = "text/plain";
  head.keepAlive = false;
  WriteAndLinger(FormatResponseHead(head) + body);
}

void Session::WriteAndLinger(std::string text) {
  head_.reset();
  fixedResponse_ = std::move(text);
  Write(asio::buffer(fixedResponse_), &Session::LingeringClose);
}

void Session::Write(asio::const_buffer data, Step next) {
  stream_.expires_after(context_->config.writeTimeout);
  asio::async_write(stream_, data, [self = shared_from_this(), next](error_code ec, size_t) {
    if (ec) {
      self->FailRequest("lumo.send.failed", ec);
      self->Close();
      return;
    }
    ((*self).*next)();
  });
}

// Closing a socket with unread input resets the connection, and the peer may
// then lose the response it has not read yet. So the sending side is shut
// down first and what the peer still sends is read and dropped, for a bounded
// time and amount, before the socket closes.
void Session::LingeringClose() {
  error_code ignored;
  stream_.socket().shutdown(asio::ip::tcp::socket::shutdown_send, ignored);
  Consume(buffer_.size());
  stream_.expires_after(context_->config.lingerTimeout);
  Drain(0);
}

void Session::Drain(uint64_t drained) {
  if (drained >= context_->config.lingerMaxBytes) {
    Close();
    return;
  }
  stream_.async_read_some(buffer_.prepare(std::min(kReadChunk, buffer_.max_size())),
                          [self = shared_from_this(), drained](error_code ec, size_t n) {
                            if (ec) {
                              self->Close();
                              return;
                            }
                            self->buffer_.commit(n);
                            self->Consume(n);
                            self->Drain(drained + n);
                          });
}

void Session::Close() {
  head_.reset();
  WipeString(responseBody_);
  stream_.close();
}

void Session::FailRequest(std::string_view context, const error_code& ec) {
  LUMO_LOG(Logger(), Log::kTrace) << "Handle request error: [" << peer_ << "] " << context << ": "
                                  << ec.message() << "\n";
}

}  // namespace Lumo::Transport::PicoHttp
