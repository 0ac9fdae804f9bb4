#include "platform/http/request_head.h"

#include <algorithm>
#include <boost/asio/buffer.hpp>
#include <boost/beast/http/error.hpp>

#include "platform/util/ascii.h"

namespace Lumo::Transport::PicoHttp {
namespace {

namespace http = boost::beast::http;

class HttpErrorCategoryImpl : public boost::system::error_category {
 public:
  const char* name() const noexcept override { return "picohttp"; }
  std::string message(int code) const override {
    switch (static_cast<HttpError>(code)) {
      case HttpError::kHeadersParse:
        return "headers parse error";
      case HttpError::kChunkParse:
        return "chunk parse error";
      case HttpError::kProtocol:
        return "http protocol error";
      case HttpError::kListen:
        return "server failed to listen";
      case HttpError::kInvalidRequest:
        return "invalid request";
      case HttpError::kIncompleteBody:
        return "incomplete body";
      case HttpError::kHeadersTooLong:
        return "http headers too long";
    }
    return "transport error";
  }
};

std::string Lower(std::string_view text) {
  std::string out(text);
  for (char& c : out) c = Groundwork::AsciiLower(c);
  return out;
}

bool Contains(std::string_view haystack, std::string_view needle) {
  return Groundwork::AsciiIContains(haystack, needle);
}

}  // namespace

const boost::system::error_category& HttpErrorCategory() {
  static const HttpErrorCategoryImpl category;
  return category;
}

boost::system::error_code MakeErrorCode(HttpError e) {
  return {static_cast<int>(e), HttpErrorCategory()};
}

int ContentTypeCode(std::string_view value) {
  static constexpr std::pair<std::string_view, int> kTypes[] = {
      {"application/json", kJson},
      {"application/vnd.tarsel.lumo.cleanjson", kCleanJson},
      {"application/vnd.tarsel.lumo.framed", kFramed},
      {"application/vnd.tarsel.lumo.cframed.cleanjson", kCframedCleanJson},
      {"application/vnd.tarsel.lumo.stream.json", kStreamJson},
      {"application/vnd.tarsel.lumo.clean.stream.json", kCleanStreamJson},
  };
  int code = 0;
  for (const auto& [type, bit] : kTypes) {
    if (Contains(value, type)) code |= bit;
  }
  return code;
}

int ResponseCodeFor(const std::optional<std::string>& accept) {
  if (!accept) return kJson;
  const int code = ContentTypeCode(*accept);
  for (int bit : {kCleanStreamJson, kStreamJson, kCleanJson}) {
    if (code & bit) return bit;
  }
  return kJson;
}

std::string_view ContentTypeForResponseCode(int responseCode) {
  switch (responseCode) {
    case kCleanJson:
      return "application/vnd.tarsel.lumo.cleanjson";
    case kStreamJson:
      return "application/vnd.tarsel.lumo.stream.json";
    case kCleanStreamJson:
      return "application/vnd.tarsel.lumo.clean.stream.json";
    default:
      return "application/json";
  }
}

std::vector<Header> TolowerAndSortHeaders(const http::fields& fields) {
  std::vector<Header> headers;
  for (const auto& field : fields) {
    headers.push_back({Lower(field.name_string()), std::string_view(field.value())});
  }
  std::stable_sort(headers.begin(), headers.end(),
                   [](const Header& a, const Header& b) { return a.name < b.name; });
  return headers;
}

bool IsBodylessMethod(std::string_view lowerMethod) {
  return lowerMethod == "get" || lowerMethod == "head" || lowerMethod == "connect" ||
         lowerMethod == "options" || lowerMethod == "trace";
}

RequestFacts GatherFacts(std::string_view lowerMethod, const std::vector<Header>& sortedHeaders,
                         std::optional<uint64_t> contentLength, bool chunked) {
  RequestFacts facts;
  facts.method = std::string(lowerMethod);
  facts.contentLength = chunked ? std::nullopt : contentLength;
  facts.chunked = chunked;
  const Header* previous = nullptr;
  for (const Header& h : sortedHeaders) {
    // Of several headers with one name the first counts.
    const bool repeated = previous && previous->name == h.name;
    previous = &h;
    if (repeated) continue;
    if (h.name == "accept") {
      facts.accept = std::string(h.value);
      facts.streamedResponse = Contains(h.value, ".stream.json");
    } else if (h.name == "content-type") {
      facts.contentType = std::string(h.value);
      facts.framedOrStreamed = Contains(h.value, ".stream.json") || Contains(h.value, ".framed");
    } else if (h.name == "connection") {
      facts.keepAlive = !Contains(h.value, "close");
    } else if (h.name == "expect") {
      facts.expect = true;
      facts.expectContinue = Groundwork::AsciiIEquals(h.value, "100-continue");
    }
  }
  facts.contentTypeCode = facts.contentType ? ContentTypeCode(*facts.contentType) : 0;
  facts.responseCode = ResponseCodeFor(facts.accept);
  facts.bodyless = IsBodylessMethod(lowerMethod) ||
                   (lowerMethod == "delete" && !facts.contentLength && !facts.chunked);
  return facts;
}

RequestHeadParser::RequestHeadParser(size_t headLimit, uint64_t bodyLimit)
    : headLimit_(headLimit), bodyLimit_(bodyLimit) {}

RequestHeadParser::Status RequestHeadParser::Fail(HttpError e) {
  error_ = MakeErrorCode(e);
  return Status::kBad;
}

RequestHeadParser::Status RequestHeadParser::Parse(std::string_view input, size_t* consumed) {
  *consumed = 0;
  if (error_) return Status::kBad;
  if (!parser_) {
    const size_t eol = input.find('\n');
    if (eol == std::string_view::npos) {
      return input.size() >= headLimit_ ? Fail(HttpError::kHeadersTooLong) : Status::kIncomplete;
    }
    const size_t space = input.substr(0, eol).find(' ');
    if (space == 0 || space == std::string_view::npos) return Fail(HttpError::kInvalidRequest);
    const std::string method = Lower(input.substr(0, space));
    parser_.emplace();
    parser_->header_limit(static_cast<std::uint32_t>(headLimit_));
    // Declared lengths are judged by the transport once the head is known.
    parser_->body_limit(boost::none);
    parser_->eager(false);
    if (IsBodylessMethod(method)) parser_->skip(true);
  }

  boost::beast::error_code ec;
  *consumed = parser_->put(boost::asio::buffer(input.data(), input.size()), ec);
  if (ec == http::error::need_more) {
    return input.size() >= headLimit_ ? Fail(HttpError::kHeadersTooLong) : Status::kIncomplete;
  }
  if (ec == http::error::header_limit) return Fail(HttpError::kHeadersTooLong);
  if (ec == http::error::bad_content_length) return Fail(HttpError::kInvalidRequest);
  if (ec) return Fail(HttpError::kHeadersParse);
  if (!parser_->is_header_done()) return Status::kIncomplete;

  const auto& message = parser_->get();
  const std::string method = Lower(message.method_string());
  if (method.empty()) return Fail(HttpError::kInvalidRequest);
  // How the body is framed is what the parser itself will go by, not what a
  // header merely mentions ("chunkedx" is not chunked).
  std::optional<uint64_t> contentLength;
  if (auto declared = parser_->content_length()) contentLength = *declared;
  facts_ = GatherFacts(method, TolowerAndSortHeaders(message), contentLength, parser_->chunked());
  parser_->body_limit(bodyLimit_);
  return Status::kComplete;
}

bool RequestHeadParser::DeclaredBodyTooLarge() const {
  return parser_ && parser_->is_header_done() && !parser_->is_done() && facts_.contentLength &&
         *facts_.contentLength > bodyLimit_;
}

size_t RequestHeadParser::PutBody(boost::asio::const_buffer bytes, boost::beast::error_code& ec) {
  if (DeclaredBodyTooLarge()) {
    ec = http::error::body_limit;
    return 0;
  }
  return parser_->put(bytes, ec);
}

}  // namespace Lumo::Transport::PicoHttp
