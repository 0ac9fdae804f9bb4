// Request heads, response heads and the formats of the transport, on bytes.
#include "platform/http/request_head.h"

#include <gtest/gtest.h>

#include "platform/http/response.h"
#include "platform/http/server_config.h"

namespace {

using namespace Lumo::Transport::PicoHttp;

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

RequestFacts ParseWhole(const std::string& head) {
  RequestHeadParser parser(64 * 1024, 2'500'000);
  size_t consumed = 0;
  EXPECT_EQ(parser.Parse(head, &consumed), RequestHeadParser::Status::kComplete) << head;
  return parser.Facts();
}

TEST(RequestHeadParser, HeadArrivingInPiecesParsesAsAWhole) {
  const std::string head =
      "POST /api HTTP/1.1\r\nHost: h\r\nContent-Type: application/json\r\n"
      "ACCEPT: application/vnd.tarsel.lumo.stream.json\r\nContent-Length: 7\r\n"
      "Connection: Keep-Alive\r\nExpect: 100-Continue\r\n\r\n";
  const std::string input = head + "{\"a\":1}";
  for (size_t cut = 1; cut < head.size(); ++cut) {
    // As a session does: what a call consumed is gone before the next call.
    RequestHeadParser parser(64 * 1024, 2'500'000);
    size_t first = 0;
    size_t second = 0;
    ASSERT_EQ(parser.Parse(std::string_view(input).substr(0, cut), &first),
              RequestHeadParser::Status::kIncomplete)
        << cut;
    ASSERT_EQ(parser.Parse(std::string_view(input).substr(first), &second),
              RequestHeadParser::Status::kComplete)
        << cut;
    EXPECT_EQ(first + second, head.size());
    const RequestFacts& f = parser.Facts();
    EXPECT_EQ(f.method, "post");
    EXPECT_EQ(f.contentTypeCode, kJson);
    EXPECT_EQ(f.responseCode, 16);
    EXPECT_TRUE(f.streamedResponse);
    EXPECT_EQ(f.contentLength, 7u);
    EXPECT_TRUE(f.keepAlive);
    EXPECT_TRUE(f.expect && f.expectContinue);
    EXPECT_FALSE(parser.Parser().is_done());
  }
}

TEST(RequestHeadParser, Facts) {
  auto chunked = ParseWhole(
      "PUT / HTTP/1.1\r\nTransfer-Encoding: chunked\r\nConnection: keep-alive, CLOSE\r\n"
      "Expect: 200-ok\r\nContent-Type: application/vnd.tarsel.lumo.framed\r\n\r\n");
  EXPECT_TRUE(chunked.chunked);
  EXPECT_FALSE(chunked.contentLength);
  EXPECT_FALSE(chunked.keepAlive);
  EXPECT_TRUE(chunked.expect && !chunked.expectContinue);
  EXPECT_TRUE(chunked.framedOrStreamed);
  EXPECT_FALSE(chunked.bodyless);

  auto repeated = ParseWhole(
      "POST / HTTP/1.1\r\nContent-Type: text/xml\r\ncontent-type: application/json\r\n\r\n");
  EXPECT_EQ(repeated.contentType, "text/xml");
  EXPECT_EQ(repeated.contentTypeCode, 0);

  EXPECT_TRUE(ParseWhole("DELETE / HTTP/1.1\r\n\r\n").bodyless);
  EXPECT_FALSE(ParseWhole("DELETE / HTTP/1.1\r\nContent-Length: 2\r\n\r\n").bodyless);
}

TEST(RequestHeadParser, BodylessMethodsIgnoreDeclaredBodies) {
  for (std::string method : {"GET", "head", "OPTIONS", "TRACE", "CONNECT"}) {
    std::string target = method == "CONNECT" ? "h:1" : "/";
    RequestHeadParser parser(64 * 1024, 2'500'000);
    std::string input = method + " " + target + " HTTP/1.1\r\nContent-Length: 5\r\n\r\nNEXT";
    size_t consumed = 0;
    ASSERT_EQ(parser.Parse(input, &consumed), RequestHeadParser::Status::kComplete) << method;
    EXPECT_TRUE(parser.Facts().bodyless);
    EXPECT_TRUE(parser.Parser().is_done());
    EXPECT_EQ(input.substr(consumed), "NEXT");
  }
}

TEST(ResponseHead, ChunkSizeLines) {
  EXPECT_EQ(ChunkSizeLines(100'000), (std::vector<std::string>{"10000\r\n", "86a0\r\n"}));
  EXPECT_EQ(ChunkSizeLines(65'536), (std::vector<std::string>{"10000\r\n"}));
  EXPECT_TRUE(ChunkSizeLines(0).empty());
}

TEST(ServerConfigText, DurationsUseTheLargestFittingUnit) {
  using namespace std::chrono;
  using Lumo::Transport::DurationToString;
  EXPECT_EQ(DurationToString(nanoseconds(999)), "999 nanoseconds");
  EXPECT_EQ(DurationToString(nanoseconds(1'500)), "1 microseconds");
  EXPECT_EQ(DurationToString(microseconds(999'999)), "999 milliseconds");
  EXPECT_EQ(DurationToString(seconds(59)), "59 seconds");
  EXPECT_EQ(DurationToString(seconds(60)), "1 minutes and 0 seconds");
  EXPECT_EQ(DurationToString(seconds(1234)), "20 minutes and 34 seconds");
}

}  // namespace
