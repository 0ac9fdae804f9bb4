// Response bytes: the canned responses, response heads in their fixed form,
// chunk framing, and the bodies the transport writes on its own (refused
// requests, failed handling). Pure functions.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/transport_call.h"

namespace Lumo::Transport::PicoHttp {

inline constexpr std::string_view kCanned400 =
    "HTTP/1.1 400 Bad Request\r\nContent-Length: 0\r\nConnection: close\r\n"
    "Server: LUMO-PicoHttp\r\n\r\n";
inline constexpr std::string_view kCanned417 =
    "HTTP/1.1 417 Expectation Failed\r\nConnection: close\r\nContent-Length: 0\r\n\r\n";
inline constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

inline constexpr size_t kMaxChunkSize = 65'536;

struct ResponseHead {
  int status = 200;
  std::string_view reason = "OK";
  // Unset: "Transfer-Encoding: chunked" instead of a length line.
  std::optional<uint64_t> contentLength;
  std::string_view contentType;
  bool keepAlive = true;
  std::string_view lumoError;   // empty: no "lumo-error" header
  bool answersConnect = false;  // a 2xx answer to CONNECT carries no length
};

// Status line, the length line, Content-Type, Connection, lumo-error, Server
// and the empty line, in that order.
std::string FormatResponseHead(const ResponseHead& head);

// The chunk size lines of a chunked body of `bodySize` bytes: one lower-case
// hex size followed by CRLF per chunk of at most kMaxChunkSize bytes. The
// caller frames each chunk as size line, data, CRLF, then ends with "0\r\n\r\n".
std::vector<std::string> ChunkSizeLines(size_t bodySize);

// A JSON-RPC error body for a request the protocol handler refuses: the
// error's "code" is 400 and its "message" the text of `messageId` (filled
// with `contentType` where the message names it); data.name carries `name`.
std::string RefusalBody(std::string_view name, std::string_view messageId,
                        std::string_view contentType);

// The result that stands in for a call whose handling failed (the handler
// threw, or dropped its completion): the standard internal server error.
HttpCallResult InternalServerErrorResult();

// Overwrites the whole buffer of `text` (it may hold key material or a token)
// and empties it.
void WipeString(std::string& text);

}  // namespace Lumo::Transport::PicoHttp
