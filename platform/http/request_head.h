// Request heads: the transport's error codes, the facts it takes from a head,
// the content-type codes, and an incremental head parser on Beast's request
// parser. Pure functions and single-owner objects; nothing here touches a
// socket, so each piece can be tested and fuzzed on bytes alone.
#pragma once

#include <boost/asio/buffer.hpp>
#include <boost/beast/core/error.hpp>
#include <boost/beast/http/fields.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/string_body.hpp>
#include <boost/system/error_code.hpp>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace Lumo::Transport::PicoHttp {

// Errors of the HTTP server (category "lumo.picohttp").
enum class HttpError : int {
  kHeadersParse = 1,    // "headers parse error"
  kChunkParse = 2,      // "chunk parse error"
  kProtocol = 3,        // "http protocol error"
  kListen = 4,          // "server failed to listen"
  kInvalidRequest = 5,  // "invalid request"
  kIncompleteBody = 6,  // "incomplete body"
  kHeadersTooLong = 7,  // "http headers too long"
};
const boost::system::error_category& HttpErrorCategory();
boost::system::error_code MakeErrorCode(HttpError e);

// Content-type codes: one bit per media type the value contains.
enum ContentTypeBit : int {
  kJson = 1,              // "application/json"
  kCleanJson = 2,         // "application/vnd.tarsel.lumo.cleanjson"
  kFramed = 4,            // "application/vnd.tarsel.lumo.framed"
  kCframedCleanJson = 8,  // "application/vnd.tarsel.lumo.cframed.cleanjson"
  kStreamJson = 16,       // "application/vnd.tarsel.lumo.stream.json"
  kCleanStreamJson = 32,  // "application/vnd.tarsel.lumo.clean.stream.json"
};

// Media types compare without regard to letter case.
int ContentTypeCode(std::string_view value);
// The response code chosen by an "accept" value: 32, 16 or 2 when it has that
// bit (in this order of preference), else 1; 1 without the header.
int ResponseCodeFor(const std::optional<std::string>& accept);
// The media type written as the response's "Content-Type" for that code.
std::string_view ContentTypeForResponseCode(int responseCode);

struct Header {
  std::string name;        // lower-cased
  std::string_view value;  // points into the parsed message
};
// The message's headers with lower-cased names, sorted by name (headers of
// one name keep their order). Valid while `fields` is unchanged.
std::vector<Header> TolowerAndSortHeaders(const boost::beast::http::fields& fields);

// What the transport needs to know about a request head.
struct RequestFacts {
  std::string method;  // lower-cased
  std::optional<std::string> accept;
  std::optional<std::string> contentType;
  int contentTypeCode = 0;
  int responseCode = 1;
  bool streamedResponse = false;          // "accept" contains ".stream.json"
  bool framedOrStreamed = false;          // content type contains ".stream.json" or ".framed"
  std::optional<uint64_t> contentLength;  // declared; reset for a chunked body
  bool chunked = false;
  bool keepAlive = true;        // false when "connection" contains "close"
  bool expect = false;          // an "expect" header is present
  bool expectContinue = false;  // ... and it is "100-continue" in any case
  bool bodyless = false;        // the request has no body whatever it declares
};

// Methods whose body is ignored whatever their headers declare.
bool IsBodylessMethod(std::string_view lowerMethod);

// Facts from the sorted headers of a parsed head. `contentLength` is the
// parser's validated Content-Length, if any, and `chunked` whether the
// parser reads the body as chunked.
RequestFacts GatherFacts(std::string_view lowerMethod, const std::vector<Header>& sortedHeaders,
                         std::optional<uint64_t> contentLength, bool chunked);

using RequestParser = boost::beast::http::request_parser<boost::beast::http::string_body>;

// Parses one request head from bytes as they arrive. The method is read from
// the request line before any byte reaches Beast, because a body can only be
// switched off (skip) before the parser has seen anything. Afterwards the
// same parser reads the body: Parser() with its body limit set.
class RequestHeadParser {
 public:
  enum class Status { kIncomplete, kComplete, kBad };

  // `headLimit` bounds the head (request line and headers) in bytes;
  // `bodyLimit` is applied to the body once the head is complete.
  RequestHeadParser(size_t headLimit, uint64_t bodyLimit);

  // Parses from the front of `input` (everything buffered and not yet
  // consumed). Sets *consumed to the bytes taken; the caller drops them.
  // kIncomplete: call again with more bytes. kBad: Error() says why.
  Status Parse(std::string_view input, size_t* consumed);

  boost::system::error_code Error() const { return error_; }
  const RequestFacts& Facts() const { return facts_; }
  RequestParser& Parser() { return *parser_; }

  // True once the head is complete and it declares a Content-Length above
  // the body limit (and the body is not skipped).
  bool DeclaredBodyTooLarge() const;

  // Feeds body bytes to the parser; returns the bytes taken. A declared
  // length above the limit fails with http::error::body_limit before Beast
  // sees a byte: its string body reserves the declared length up front.
  size_t PutBody(boost::asio::const_buffer bytes, boost::beast::error_code& ec);

 private:
  Status Fail(HttpError e);

  size_t headLimit_;
  uint64_t bodyLimit_;
  std::optional<RequestParser> parser_;
  RequestFacts facts_;
  boost::system::error_code error_;
};

}  // namespace Lumo::Transport::PicoHttp
