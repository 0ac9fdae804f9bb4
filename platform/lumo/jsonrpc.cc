#include "platform/lumo/jsonrpc.h"

#include <openssl/crypto.h>
#include <strings.h>

#include <boost/json/parse.hpp>

#include "platform/lumo/json_storage.h"

namespace Lumo::Protocol {
namespace {

using boost::json::object;
using boost::json::value;

void Wipe(std::string& s) {
  OPENSSL_cleanse(s.data(), s.size());
  s.clear();
}

// The token of "Bearer <token>" (scheme in any letter case); empty otherwise.
std::string_view BearerToken(std::string_view header) {
  constexpr std::string_view kScheme = "bearer";
  while (!header.empty() && (header.front() == ' ' || header.front() == '\t'))
    header.remove_prefix(1);
  if (header.size() <= kScheme.size() ||
      strncasecmp(header.data(), kScheme.data(), kScheme.size()) != 0 ||
      (header[kScheme.size()] != ' ' && header[kScheme.size()] != '\t')) {
    return {};
  }
  header.remove_prefix(kScheme.size());
  while (!header.empty() && (header.front() == ' ' || header.front() == '\t'))
    header.remove_prefix(1);
  while (!header.empty() && (header.back() == ' ' || header.back() == '\t'))
    header.remove_suffix(1);
  return header;
}

value ErrorJson(const Data::ErrorValue& error) {
  object out(Groundwork::WipingJsonStorage());
  out["name"] = error.Name();
  if (error.Type()) out["errorType"] = Data::ErrorTypeName(*error.Type());
  out["messages"] = Data::MessagesToJson(error.Messages());
  return out;
}

Transport::HttpCallResult Respond(value id, value result) {
  object response(Groundwork::WipingJsonStorage());
  response["jsonrpc"] = "2.0";
  response["id"] = std::move(id);
  response["result"] = std::move(result);
  return {Groundwork::SerializeWiping(response), {}};
}

Transport::HttpCallResult ProtocolError(value id, int code, std::string message) {
  object response;
  response["jsonrpc"] = "2.0";
  response["id"] = std::move(id);
  response["error"] = object{{"code", code}, {"message", std::move(message)}};
  return {Groundwork::SerializeWiping(response), {}};
}

Transport::HttpCallResult Serialize(value id, int responseCode, Core::MethodResult result) {
  const bool direct = responseCode == 2 || responseCode == 8 || responseCode == 32;
  switch (result.kind) {
    case Core::MethodResult::Kind::kOutput: {
      if (direct) return Respond(std::move(id), std::move(result.output));
      object wrapped(Groundwork::WipingJsonStorage());
      wrapped["output"] = std::move(result.output);
      return Respond(std::move(id), std::move(wrapped));
    }
    case Core::MethodResult::Kind::kError: {
      object wrapped(Groundwork::WipingJsonStorage());
      wrapped["error"] = ErrorJson(*result.error);
      Transport::HttpCallResult out = Respond(std::move(id), std::move(wrapped));
      out.errorName = result.error->Name();
      return out;
    }
    case Core::MethodResult::Kind::kInvalidParams:
      return ProtocolError(std::move(id), kInvalidParams, "Invalid params: " + result.detail);
  }
  return ProtocolError(std::move(id), kInvalidRequest, "Invalid Request");
}

class Handler {
 public:
  Handler(Provider::ApiProviderPtr provider, std::shared_ptr<const L10n::Localizer> localizer,
          std::shared_ptr<Log::Logger> logger)
      : provider_(std::move(provider)),
        localizer_(std::move(localizer)),
        logger_(std::move(logger)) {}

  void operator()(const std::shared_ptr<Transport::HttpCall>& http,
                  const std::function<void(Transport::HttpCallResult)>& done) const {
    boost::system::error_code ec;
    value request = boost::json::parse(http->body, ec, Groundwork::WipingJsonStorage());
    Wipe(http->body);
    if (ec) {
      Wipe(http->authorization);
      LUMO_LOG(logger_, Log::kDebug) << "JSON-RPC body is not JSON: " << ec.message() << "\n";
      done(ProtocolError(nullptr, kParseError, "Parse error"));
      return;
    }
    value id = nullptr;
    std::string method;
    value params(Groundwork::WipingJsonStorage());
    if (!Envelope(request, id, method, params)) {
      Wipe(http->authorization);
      done(ProtocolError(std::move(id), kInvalidRequest, "Invalid Request"));
      return;
    }
    if (!params.is_object()) {
      Wipe(http->authorization);
      done(
          ProtocolError(std::move(id), kInvalidParams, "Invalid params: params must be an object"));
      return;
    }

    auto call = std::make_shared<Core::Call>(std::move(method), std::move(params));
    std::string_view token = BearerToken(http->authorization);
    if (!token.empty()) {
      call->activation.securityContext.scheme = Core::SecurityContext::kOAuthScheme;
      call->activation.securityContext.accessToken.assign(token);
    }
    Wipe(http->authorization);
    // Only en_US exists: every Accept-Language falls back to it.
    call->activation.requestLocalizer = localizer_;

    int responseCode = http->responseCode;
    Core::Completion completion(
        call, [id = std::move(id), responseCode, done](Core::MethodResult result) mutable {
          done(Serialize(std::move(id), responseCode, std::move(result)));
        });
    provider_->Invoke(std::move(call), std::move(completion));
  }

 private:
  // Checks the request envelope; fills `id` (when usable), `method` and
  // `params` (an empty object when absent or null).
  static bool Envelope(value& request, value& id, std::string& method, value& params) {
    if (!request.is_object()) return false;
    object& obj = request.get_object();
    if (value* v = obj.if_contains("id")) {
      if (!v->is_string() && !v->is_number() && !v->is_null()) return false;
      id = std::move(*v);
    }
    value* version = obj.if_contains("jsonrpc");
    if (version == nullptr || !version->is_string() || version->get_string() != "2.0") return false;
    value* m = obj.if_contains("method");
    if (m == nullptr || !m->is_string() || m->get_string().empty()) return false;
    method.assign(m->get_string().data(), m->get_string().size());
    for (const auto& member : obj) {
      std::string_view key = member.key();
      if (key != "jsonrpc" && key != "id" && key != "method" && key != "params") return false;
    }
    value* p = obj.if_contains("params");
    if (p == nullptr || p->is_null()) {
      params.emplace_object();
    } else {
      params = std::move(*p);
    }
    return true;
  }

  Provider::ApiProviderPtr provider_;
  std::shared_ptr<const L10n::Localizer> localizer_;
  std::shared_ptr<Log::Logger> logger_;
};

}  // namespace

Transport::HttpCallHandler MakeJsonRpcHandler(Provider::ApiProviderPtr provider,
                                              std::shared_ptr<const L10n::Localizer> localizer,
                                              std::shared_ptr<Log::Logger> logger) {
  auto handler =
      std::make_shared<const Handler>(std::move(provider), std::move(localizer), std::move(logger));
  return [handler](std::shared_ptr<Transport::HttpCall> call,
                   std::function<void(Transport::HttpCallResult)> done) { (*handler)(call, done); };
}

}  // namespace Lumo::Protocol
