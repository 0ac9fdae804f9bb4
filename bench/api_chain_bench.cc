// Cost of one call through the assembled provider chain, from JSON-RPC body
// to serialized response, with the key server client faked: what the daemon
// adds to each key operation besides the network and the key servers.
#include <benchmark/benchmark.h>

#include "platform/audit/audit.h"
#include "tests/api/token_signer.h"
#include "tests/support/api_chain.h"
#include "tests/support/fake_kms.h"

namespace {

class NullAuditSink : public Tsl::Audit::AuditSink {
 public:
  bool Write(std::string_view) override { return true; }
};

struct Chain {
  Chain() : chain(Dependencies()) {
    attestation = ZyrdTest::TokenBuilder::Valid(time(nullptr)).Exp(time(nullptr) + 3600).Sign();
  }

  static Zyrd::ZyrApi::ProviderDependencies Dependencies() {
    Groundwork::SetLogThreshold(2);
    static NullAuditSink sink;
    Tsl::Audit::SetAuditSink(&sink);
    auto providers = std::make_shared<ZyrdTest::FakeProviders>();
    providers->Add(
        "p1", std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{{"s1"}}));
    Zyrd::ZyrApi::ProviderDependencies deps;
    deps.providers = providers;
    deps.readVouchdPublicKey = [](std::string& key) {
      key = ZyrdTest::VouchdKey().publicPem;
      return true;
    };
    return deps;
  }

  void Run(benchmark::State& state, const std::string& token, const std::string& body) {
    size_t bytes = 0;
    for (auto _ : state) bytes += chain.Send(body, token).body.size();
    benchmark::DoNotOptimize(bytes);
  }

  ZyrdTest::ApiChain chain;
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
  TheChain().Run(state, TheChain().chain.AdminToken(), kGenerate);
}
BENCHMARK(BM_GenerateKeyWithAdminToken);

void BM_HostStatusWithAdminToken(benchmark::State& state) {
  TheChain().Run(state, TheChain().chain.AdminToken(),
                 R"({"jsonrpc":"2.0","id":1,"method":"com.tarsel.orna.kms.status.get"})");
}
BENCHMARK(BM_HostStatusWithAdminToken);

}  // namespace

BENCHMARK_MAIN();
