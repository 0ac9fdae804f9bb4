// Feeds arbitrary bytes as the body of an HTTP call to the JSON-RPC handler
// over the fully assembled API provider (with an admin token, so inputs reach
// the services' decoders and the management services run). The store is a
// scratch database and the firewall a stand-in that accepts every change.
// Every body must get exactly one answer.
#include <stdlib.h>
#include <unistd.h>

#include <cstdint>

#include "platform/audit/audit.h"
#include "platform/configstore/sqlite_store.h"
#include "tests/support/api_chain.h"
#include "tests/support/fake_kms.h"

namespace {

class NullAuditSink : public Tsl::Audit::AuditSink {
 public:
  bool Write(std::string_view) override { return true; }
};

std::shared_ptr<OrnaConfigStore::ConfigStore>& Store() {
  static std::shared_ptr<OrnaConfigStore::ConfigStore> store;
  return store;
}

// Every input starts from a store without providers, so that inputs do not
// depend on each other and the store does not grow.
void ClearProviders() {
  std::vector<OrnaConfigStore::ErrorInfo> errors;
  Store()->Import(R"({"format":"orna-configstore-export","version":1,)"
                  R"("scope":[{"key":"providers","group":"kms","component":"orna"}],"objects":[]})",
                  errors);
}

class AcceptingFirewall : public Zyrd::State::HostFirewall {
 public:
  bool AddOrRemoveServer(const std::string&, bool, const std::string&) override { return true; }
};

Zyrd::ZyrApi::ProviderDependencies Dependencies() {
  Groundwork::SetLogThreshold(Groundwork::kLogOff);
  static NullAuditSink sink;
  Tsl::Audit::SetAuditSink(&sink);
  // On tmpfs, where flushing to disk costs nothing, when there is one.
  if (access("/dev/shm", W_OK) == 0) setenv("TMPDIR", "/dev/shm", 1);
  static ZyrdTest::TempDir storeDir;
  Store() = OrnaConfigStore::SqliteConfigStore::Open(storeDir / "configstore.db");
  OrnaConfigStore::ConfigStore::SetGlobalStore(Store());
  static AcceptingFirewall host;
  static Zyrd::State::Firewall firewall(host);
  auto providers = std::make_shared<ZyrdTest::FakeProviders>();
  providers->Add("p1", std::make_shared<ZyrdTest::FakeKms>(std::vector<ZyrdTest::FakeKms::Server>{
                           {"s1", Zyrd::Kms::KeyServerTimeout}, {"s2"}}));
  Zyrd::ZyrApi::ProviderDependencies deps;
  deps.providers = providers;
  deps.firewall = &firewall;
  deps.readVouchdPublicKey = [](std::string&) { return false; };
  return deps;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static ZyrdTest::ApiChain chain(Dependencies());
  ClearProviders();
  auto call = std::make_shared<Lumo::Transport::HttpCall>();
  call->body.assign(reinterpret_cast<const char*>(data), size);
  call->authorization = "Bearer " + chain.AdminToken();
  call->responseCode = size % 2 == 0 ? 1 : 2;
  int answers = 0;
  chain.Handler()(call, [&](Lumo::Transport::HttpCallResult) { ++answers; });
  if (answers != 1) abort();
  return 0;
}
