// Request heads from the network: fed in two pieces, as reads deliver them,
// then whatever follows is read as the body.
#include <boost/asio/buffer.hpp>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "platform/http/request_head.h"

using Lumo::Transport::PicoHttp::RequestHeadParser;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  // The first byte chooses where the first read ends.
  const size_t cut = data[0] % size;
  std::string_view input(reinterpret_cast<const char*>(data + 1), size - 1);

  RequestHeadParser parser(4096, 1 << 16);
  size_t consumed = 0;
  auto status = parser.Parse(input.substr(0, cut), &consumed);
  size_t offset = consumed;
  if (status == RequestHeadParser::Status::kIncomplete) {
    status = parser.Parse(input.substr(offset), &consumed);
    offset += consumed;
  }
  if (status != RequestHeadParser::Status::kComplete) return 0;

  while (!parser.Parser().is_done() && offset < input.size()) {
    boost::beast::error_code ec;
    const size_t n =
        parser.PutBody(boost::asio::buffer(input.data() + offset, input.size() - offset), ec);
    offset += n;
    if (ec || n == 0) break;
  }
  return 0;
}
