#include "platform/http/response.h"

#include <openssl/crypto.h>

#include <boost/json.hpp>
#include <charconv>

#include "platform/lumo/errors.h"
#include "platform/lumo/messages.h"

namespace Lumo::Transport::PicoHttp {
namespace {

// Default texts of the framework's core messages the transport uses.
std::string CoreMessageText(std::string_view id, std::string_view contentType) {
  if (id == "lumo.invalid.content.type") {
    return L10n::FormatTemplate("Unsupported content type '{contentType}'.",
                                {{"contentType", std::string(contentType)}});
  }
  if (id == "lumo.request.exceeds.max.size") return "The request exceeds the maximum size.";
  return "Invalid request.";
}

void AppendNumber(std::string& out, uint64_t value, int base) {
  char digits[24];
  auto end = std::to_chars(digits, digits + sizeof(digits), value, base).ptr;
  out.append(digits, end);
}

}  // namespace

std::string FormatResponseHead(const ResponseHead& head) {
  std::string out;
  out.reserve(160 + head.lumoError.size());
  out += "HTTP/1.1 ";
  AppendNumber(out, static_cast<uint64_t>(head.status), 10);
  out += ' ';
  out += head.reason;
  out += "\r\n";
  if (!head.contentLength) {
    out += "Transfer-Encoding: chunked\r\n";
  } else {
    out += "Content-Length: ";
    AppendNumber(out, *head.contentLength, 10);
    out += "\r\n";
  }
  out += "Content-Type: ";
  out += head.contentType;
  out += "\r\nConnection: ";
  out += head.keepAlive ? "Keep-Alive" : "close";
  out += "\r\n";
  if (!head.lumoError.empty()) {
    out += "lumo-error: ";
    out += head.lumoError;
    out += "\r\n";
  }
  out += "Server: LUMO-PicoHttp\r\n\r\n";
  return out;
}

std::vector<std::string> ChunkSizeLines(size_t bodySize) {
  std::vector<std::string> lines;
  for (size_t offset = 0; offset < bodySize; offset += kMaxChunkSize) {
    std::string line;
    AppendNumber(line, std::min(kMaxChunkSize, bodySize - offset), 16);
    line += "\r\n";
    lines.push_back(std::move(line));
  }
  return lines;
}

std::string RefusalBody(std::string_view name, std::string_view messageId,
                        std::string_view contentType) {
  boost::json::object error;
  error["code"] = 400;
  error["message"] = CoreMessageText(messageId, contentType);
  error["data"] = boost::json::object{{"name", name}, {"id", messageId}};
  return boost::json::serialize(
      boost::json::object{{"jsonrpc", "2.0"}, {"id", nullptr}, {"error", std::move(error)}});
}

HttpCallResult InternalServerErrorResult() {
  using Error = Com::Tarsel::Lumo::Std::Errors::InternalServerError;
  boost::json::object error{{"name", Error::kName},
                            {"errorType", Data::ErrorTypeName(Error::kType)},
                            {"messages", boost::json::array()}};
  boost::json::object body{{"jsonrpc", "2.0"},
                           {"id", nullptr},
                           {"result", boost::json::object{{"error", std::move(error)}}}};
  return {boost::json::serialize(body), Error::kName};
}

void WipeString(std::string& text) {
  text.resize(text.capacity());
  OPENSSL_cleanse(text.data(), text.size());
  text.clear();
}

}  // namespace Lumo::Transport::PicoHttp
