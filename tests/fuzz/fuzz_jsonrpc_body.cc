// Feeds arbitrary bytes as the body of an HTTP call to the JSON-RPC handler
// over the fully assembled API provider (with an admin token, so inputs reach
// the services' decoders). Every body must get exactly one answer.
#include <stdlib.h>

#include <cstdint>
#include <cstdio>
#include <string>

#include "api/provider.h"
#include "platform/audit/audit.h"
#include "platform/lumo/jsonrpc.h"
#include "platform/util/log.h"
#include "tests/support/fake_kms.h"

namespace {

class NullAuditSink : public Tsl::Audit::AuditSink {
 public:
  bool Write(std::string_view) override { return true; }
};

struct Fixture {
  Fixture() {
    Groundwork::SetLogThreshold(Groundwork::kLogOff);
    Tsl::Audit::SetAuditSink(&sink);
    char dir[] = "/tmp/zyrd-fuzz-XXXXXX";
    std::string tokenPath = std::string(mkdtemp(dir)) + "/admin.token";
    auto providers = std::make_shared<ZyrdTest::FakeProviders>();
    providers->Add("p1", std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{
                             {"s1", Zyrd::Kms::KeyServerTimeout}, {"s2"}}));
    Zyrd::ZyrApi::ProviderDependencies deps = Zyrd::ZyrApi::DefaultDependencies();
    deps.providers = providers;
    deps.readVouchdPublicKey = [](std::string&) { return false; };
    deps.metadataPath = ZYRD_SOURCE_DIR "/metadata/zyr_lumo_metadata.json";
    deps.adminTokenPath = tokenPath;
    auto logger = std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level);
    handler = Lumo::Protocol::MakeJsonRpcHandler(
        Zyrd::ZyrApi::CreateLocalProvider([](std::function<void()> t) { t(); }, logger, deps),
        nullptr, logger);
    FILE* f = fopen(tokenPath.c_str(), "r");
    char line[128] = {};
    if (f != nullptr && fgets(line, sizeof(line), f) != nullptr) token = line;
    if (f != nullptr) fclose(f);
    while (!token.empty() && token.back() == '\n') token.pop_back();
  }

  NullAuditSink sink;
  Lumo::Transport::HttpCallHandler handler;
  std::string token;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static Fixture fixture;
  auto call = std::make_shared<Lumo::Transport::HttpCall>();
  call->body.assign(reinterpret_cast<const char*>(data), size);
  call->authorization = "Bearer " + fixture.token;
  call->responseCode = size % 2 == 0 ? 1 : 2;
  int answers = 0;
  fixture.handler(call, [&](Lumo::Transport::HttpCallResult) { ++answers; });
  if (answers != 1) abort();
  return 0;
}
