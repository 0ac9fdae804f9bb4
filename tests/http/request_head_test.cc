// Request heads and the formats of the transport, on bytes.
#include "platform/http/request_head.h"

#include <gtest/gtest.h>
#include <boost/beast/http/error.hpp>

namespace {

using namespace Lumo::Transport::PicoHttp;
using Status = RequestHeadParser::Status;

TEST(ContentTypes, CodesAndResponseChoice) {
  EXPECT_EQ(ContentTypeCode("Application/JSON; charset=utf-8"), kJson);
  EXPECT_EQ(ContentTypeCode("text/xml"), 0);
  // Neither stream type contains the other.
  EXPECT_EQ(ContentTypeCode("application/vnd.tarsel.lumo.clean.stream.json"), kCleanStreamJson);
  EXPECT_EQ(ResponseCodeFor(std::nullopt), 1);
  EXPECT_EQ(ResponseCodeFor("application/vnd.tarsel.lumo.cleanjson, "
                            "application/vnd.tarsel.lumo.stream.json"),
            16);
  EXPECT_EQ(ResponseCodeFor("application/vnd.tarsel.lumo.stream.json, "
                            "application/vnd.tarsel.lumo.clean.stream.json"),
            32);
}

TEST(RequestHeadParser, HeadArrivingInPiecesParsesAsAWhole) {
  const std::string head =
      "POST /api HTTP/1.1\r\nHost: h\r\nContent-Type: application/json\r\n"
      "ACCEPT: application/vnd.tarsel.lumo.stream.json\r\nContent-Length: 7\r\n"
      "Connection: Keep-Alive\r\nExpect: 100-Continue\r\n\r\n";
  const std::string whole = head + "{\"a\":1}";
  const std::string_view input = whole;
  for (size_t cut = 1; cut < head.size(); ++cut) {
    // As a session does: what a call consumed is gone before the next call.
    RequestHeadParser parser(64 * 1024, 2'500'000);
    size_t first = 0, second = 0;
    ASSERT_EQ(parser.Parse(input.substr(0, cut), &first), Status::kIncomplete) << cut;
    ASSERT_EQ(parser.Parse(input.substr(first), &second), Status::kComplete) << cut;
    EXPECT_EQ(first + second, head.size());
    const RequestFacts& f = parser.Facts();
    EXPECT_EQ(f.method, "post");
    EXPECT_EQ(f.contentTypeCode, kJson);
    EXPECT_EQ(f.responseCode, 16);
    EXPECT_TRUE(f.streamedResponse && f.keepAlive && f.expect && f.expectContinue);
    EXPECT_EQ(f.contentLength, 7u);
    EXPECT_FALSE(parser.Parser().is_done());
  }
}

// A huge declared length is refused before the body parser allocates for it.
TEST(RequestHeadParser, DeclaredBodyAboveTheLimitIsRefusedWithoutBuffering) {
  for (const char* length : {"2500001", "000000000000000000090000379213"}) {
    RequestHeadParser parser(64 * 1024, 2'500'000);
    const std::string input = std::string("POST /api HTTP/1.1\r\nContent-Length: ") + length +
                              "\r\nContent-Type: application/json\r\n\r\n{}";
    size_t consumed = 0;
    ASSERT_EQ(parser.Parse(input, &consumed), Status::kComplete) << length;
    EXPECT_TRUE(parser.DeclaredBodyTooLarge());
    boost::beast::error_code ec;
    EXPECT_EQ(parser.PutBody(boost::asio::buffer(input.data() + consumed, 2), ec), 0u);
    EXPECT_EQ(ec, boost::beast::http::error::body_limit);
  }
  RequestHeadParser parser(64 * 1024, 2'500'000);
  size_t consumed = 0;
  ASSERT_EQ(parser.Parse("POST / HTTP/1.1\r\nContent-Length: 2500000\r\n\r\n", &consumed),
            Status::kComplete);
  EXPECT_FALSE(parser.DeclaredBodyTooLarge());
}

// Parses a whole head; returns the facts and what followed the head.
std::pair<RequestFacts, std::string> ParseWhole(const std::string& input) {
  RequestHeadParser parser(64 * 1024, 2'500'000);
  size_t consumed = 0;
  EXPECT_EQ(parser.Parse(input, &consumed), Status::kComplete) << input;
  EXPECT_TRUE(parser.Parser().is_done() || !parser.Facts().bodyless);
  return {parser.Facts(), input.substr(consumed)};
}

TEST(RequestHeadParser, Facts) {
  auto [chunked, rest] = ParseWhole(
      "PUT / HTTP/1.1\r\nTransfer-Encoding: chunked\r\nConnection: keep-alive, CLOSE\r\n"
      "Expect: 200-ok\r\nContent-Type: application/vnd.tarsel.lumo.framed\r\n\r\n");
  EXPECT_TRUE(chunked.chunked && chunked.framedOrStreamed && chunked.expect);
  EXPECT_FALSE(chunked.contentLength || chunked.keepAlive || chunked.expectContinue ||
               chunked.bodyless);

  // A coding that only looks like chunked leaves the declared length in
  // force, and a length beyond the limit refused before any body byte.
  RequestHeadParser lookalike(64 * 1024, 2'500'000);
  size_t consumed = 0;
  ASSERT_EQ(lookalike.Parse("POST / HTTP/1.1\r\nTransfer-Encoding: chunkedd\r\n"
                            "Content-Length: 90000379212\r\n\r\n",
                            &consumed),
            Status::kComplete);
  EXPECT_FALSE(lookalike.Facts().chunked);
  EXPECT_EQ(lookalike.Facts().contentLength, 90000379212u);
  EXPECT_TRUE(lookalike.DeclaredBodyTooLarge());

  auto repeated = ParseWhole(
      "POST / HTTP/1.1\r\nContent-Type: text/xml\r\ncontent-type: application/json\r\n\r\n");
  EXPECT_EQ(repeated.first.contentType, "text/xml");
  EXPECT_EQ(repeated.first.contentTypeCode, 0);

  EXPECT_TRUE(ParseWhole("DELETE / HTTP/1.1\r\n\r\n").first.bodyless);
  EXPECT_FALSE(ParseWhole("DELETE / HTTP/1.1\r\nContent-Length: 2\r\n\r\n").first.bodyless);
  // Methods without a body ignore a declared one: what follows is the next request.
  for (std::string method : {"GET /", "head /", "OPTIONS /", "TRACE /", "CONNECT h:1"}) {
    auto [facts, next] = ParseWhole(method + " HTTP/1.1\r\nContent-Length: 5\r\n\r\nNEXT");
    EXPECT_TRUE(facts.bodyless) << method;
    EXPECT_EQ(next, "NEXT");
  }
}

}  // namespace
