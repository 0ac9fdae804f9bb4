#include "platform/lumo/jsonrpc.h"

#include <gtest/gtest.h>

#include <boost/json/parse.hpp>

#include "platform/lumo/core_messages.h"

namespace {

using Lumo::Core::MethodResult;

// Answers by method: "ok.op" with its inputs, "err.op" with not_found,
// "bad.op" with invalid params; records the last call.
class Scripted : public Lumo::Provider::ApiProvider {
 public:
  void Invoke(Lumo::Core::CallPtr call, Lumo::Core::Completion completion) override {
    last = call;
    if (call->method == "ok.op") {
      completion.Complete(MethodResult::Output(call->input));
    } else if (call->method == "bad.op") {
      completion.Complete(MethodResult::InvalidParams("field 'x': missing"));
    } else {
      completion.Complete(MethodResult::Error(Lumo::Core::MetadataNotFoundError("thing", "t1")));
    }
  }
  Lumo::Core::CallPtr last;
};

class JsonRpcTest : public ::testing::Test {
 protected:
  Lumo::Transport::HttpCallResult Send(std::string body, std::string authorization = "",
                                       int responseCode = 1) {
    call_ = std::make_shared<Lumo::Transport::HttpCall>();
    call_->body = std::move(body);
    call_->authorization = std::move(authorization);
    call_->responseCode = responseCode;
    Lumo::Transport::HttpCallResult out;
    int calls = 0;
    handler_(call_, [&](Lumo::Transport::HttpCallResult r) {
      ++calls;
      out = std::move(r);
    });
    EXPECT_EQ(calls, 1);
    return out;
  }

  std::shared_ptr<Scripted> provider_ = std::make_shared<Scripted>();
  std::shared_ptr<const Lumo::L10n::Localizer> localizer_ =
      std::make_shared<const Lumo::L10n::Localizer>(std::vector<std::string>{"en_US"}, nullptr);
  Lumo::Transport::HttpCallHandler handler_ =
      Lumo::Protocol::MakeJsonRpcHandler(provider_, localizer_, nullptr);
  std::shared_ptr<Lumo::Transport::HttpCall> call_;
};

TEST_F(JsonRpcTest, SuccessWrapsTheOutputAndEchoesTheId) {
  auto r = Send(R"({"jsonrpc":"2.0","id":7,"method":"ok.op","params":{"a":1}})");
  EXPECT_EQ(r.body, R"({"jsonrpc":"2.0","id":7,"result":{"output":{"a":1}}})");
  EXPECT_EQ(r.errorName, "");
  r = Send(R"({"jsonrpc":"2.0","id":"x","method":"ok.op"})", "", 2);
  EXPECT_EQ(r.body, R"({"jsonrpc":"2.0","id":"x","result":{}})");
  EXPECT_EQ(provider_->last->activation.requestLocalizer, localizer_);
}

TEST_F(JsonRpcTest, ServiceErrorsCarryTheirNameInTheBodyAndTheHeader) {
  auto r = Send(R"({"jsonrpc":"2.0","id":1,"method":"err.op","params":{}})");
  EXPECT_EQ(r.errorName, "com.tarsel.lumo.std.errors.not_found");
  EXPECT_EQ(
      r.body,
      R"({"jsonrpc":"2.0","id":1,"result":{"error":{"name":"com.tarsel.lumo.std.errors.not_found",)"
      R"("errorType":"NOT_FOUND","messages":[{"id":"lumo.metadata.not.found",)"
      R"("defaultMessage":"The thing 't1' does not exist.","args":{"what":"thing","id":"t1"}}]}}})");
}

TEST_F(JsonRpcTest, MalformedRequestsGetTheJsonRpcErrorCodes) {
  const std::pair<const char*, int> cases[] = {
      {"{not json", -32700},
      {"", -32700},
      {"[]", -32600},
      {R"({"id":1,"method":"ok.op"})", -32600},
      {R"({"jsonrpc":"1.0","id":1,"method":"ok.op"})", -32600},
      {R"({"jsonrpc":"2.0","id":1,"method":""})", -32600},
      {R"({"jsonrpc":"2.0","id":{},"method":"ok.op"})", -32600},
      {R"({"jsonrpc":"2.0","id":1,"method":"ok.op","extra":1})", -32600},
      {R"({"jsonrpc":"2.0","id":1,"method":"ok.op","params":[1]})", -32602},
  };
  for (auto [body, code] : cases) {
    EXPECT_EQ(boost::json::parse(Send(body).body).at("error").at("code").as_int64(), code) << body;
  }
  auto r = Send(R"({"jsonrpc":"2.0","id":3,"method":"bad.op","params":{}})");
  EXPECT_EQ(
      r.body,
      R"({"jsonrpc":"2.0","id":3,"error":{"code":-32602,"message":"Invalid params: field 'x': missing"}})");
  EXPECT_EQ(provider_->last->method, "bad.op");
}

TEST_F(JsonRpcTest, BearerTokenBecomesTheSecurityContextAndSecretsAreWiped) {
  const std::string body = R"({"jsonrpc":"2.0","id":1,"method":"ok.op"})";
  const std::string header = "bEaReR  tok.en/with-a-long-tail";
  Send(body, header);
  const auto& context = provider_->last->activation.securityContext;
  EXPECT_EQ(context.scheme, Lumo::Core::SecurityContext::kOAuthScheme);
  EXPECT_EQ(context.accessToken.view(), "tok.en/with-a-long-tail");
  // Overwritten where they lie, not merely emptied: the buffers keep their
  // places, so their bytes can be looked at.
  EXPECT_TRUE(call_->authorization.empty());
  EXPECT_TRUE(call_->body.empty());
  EXPECT_EQ(std::string_view(call_->body.data(), body.size()), std::string(body.size(), '\0'));
  EXPECT_EQ(std::string_view(call_->authorization.data(), header.size()),
            std::string(header.size(), '\0'));

  for (const char* header : {"", "Basic dXNlcg==", "Bearer", "Bearertok"}) {
    Send(R"({"jsonrpc":"2.0","id":1,"method":"ok.op"})", header);
    EXPECT_TRUE(provider_->last->activation.securityContext.scheme.empty()) << header;
  }
}

}  // namespace
