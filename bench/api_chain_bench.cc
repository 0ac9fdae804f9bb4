// Cost of one call through the assembled provider chain, from JSON-RPC body
// to serialized response, with the key server client faked: what the daemon
// adds to each key operation besides the network and the key servers.
#include <benchmark/benchmark.h>

#include <fstream>

#include "api/provider.h"
#include "errors/error_builders.h"
#include "platform/audit/audit.h"
#include "platform/lumo/jsonrpc.h"
#include "platform/util/log.h"
#include "tests/api/token_signer.h"
#include "tests/support/fake_kms.h"
#include "tests/support/temp_dir.h"

namespace {

class NullAuditSink : public Tsl::Audit::AuditSink {
 public:
  bool Write(std::string_view) override { return true; }
};

struct Chain {
  Chain() {
    Groundwork::SetLogThreshold(2);
    Tsl::Audit::SetAuditSink(&sink);
    auto providers = std::make_shared<ZyrdTest::FakeProviders>();
    providers->Add(
        "p1", std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{{"s1"}}));
    Zyrd::ZyrApi::ProviderDependencies deps = Zyrd::ZyrApi::DefaultDependencies();
    deps.providers = providers;
    deps.readVouchdPublicKey = [](std::string& key) {
      key = ZyrdTest::VouchdKey().publicPem;
      return true;
    };
    deps.metadataPath = ZYRD_SOURCE_DIR "/metadata/zyr_lumo_metadata.json";
    deps.adminTokenPath = tmp / "admin.token";
    auto logger = std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level);
    handler = Lumo::Protocol::MakeJsonRpcHandler(
        Zyrd::ZyrApi::CreateLocalProvider([](std::function<void()> t) { t(); }, logger, deps),
        std::shared_ptr<const Lumo::L10n::Localizer>(&Zyrd::ZyrApi::CatalogueLocalizer(),
                                                     [](auto*) {}),
        logger);
    std::ifstream in(tmp / "admin.token");
    std::getline(in, admin);
    attestation = ZyrdTest::TokenBuilder::Valid(time(nullptr)).Exp(time(nullptr) + 3600).Sign();
  }

  void Run(benchmark::State& state, const std::string& token, const std::string& body) {
    size_t bytes = 0;
    for (auto _ : state) {
      auto call = std::make_shared<Lumo::Transport::HttpCall>();
      call->body = body;
      call->authorization = "Bearer " + token;
      handler(call, [&](Lumo::Transport::HttpCallResult r) { bytes += r.body.size(); });
    }
    benchmark::DoNotOptimize(bytes);
  }

  ZyrdTest::TempDir tmp;
  NullAuditSink sink;
  Lumo::Transport::HttpCallHandler handler;
  std::string admin;
  std::string attestation;
};

Chain& TheChain() {
  static Chain chain;
  return chain;
}

const std::string kGenerate =
    R"({"jsonrpc":"2.0","id":1,"method":"com.tarsel.orna.kms.key_operation.generate_key",)"
    R"("params":{"provider":"p1","keySize":32}})";

void BM_GenerateKeyWithAttestationToken(benchmark::State& state) {
  TheChain().Run(state, TheChain().attestation, kGenerate);
}
BENCHMARK(BM_GenerateKeyWithAttestationToken);

void BM_GenerateKeyWithAdminToken(benchmark::State& state) {
  TheChain().Run(state, TheChain().admin, kGenerate);
}
BENCHMARK(BM_GenerateKeyWithAdminToken);

void BM_HostStatusWithAdminToken(benchmark::State& state) {
  TheChain().Run(state, TheChain().admin,
                 R"({"jsonrpc":"2.0","id":1,"method":"com.tarsel.orna.kms.status.get"})");
}
BENCHMARK(BM_HostStatusWithAdminToken);

}  // namespace

BENCHMARK_MAIN();
