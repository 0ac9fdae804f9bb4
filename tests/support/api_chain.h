// The daemon's assembled API provider behind the JSON-RPC handler, for tests,
// benchmarks and fuzzing: metadata from the source tree, an admin token in a
// scratch directory, and whatever provider lookup and vouchd key the caller
// supplies. Needs ZYRD_SOURCE_DIR defined as the source root.
#pragma once

#include <fstream>
#include <memory>
#include <string>

#include "api/provider.h"
#include "errors/error_builders.h"
#include "platform/lumo/jsonrpc.h"
#include "platform/util/log.h"
#include "tests/support/temp_dir.h"

namespace ZyrdTest {

inline const std::string kMetadataFile =
    std::string(ZYRD_SOURCE_DIR) + "/metadata/zyr_lumo_metadata.json";

class ApiChain {
 public:
  // `deps` supplies the lookup, the key reader, the clock and the statistics;
  // the metadata and admin token paths are set here.
  explicit ApiChain(Zyrd::ZyrApi::ProviderDependencies deps) {
    deps.metadataPath = kMetadataFile;
    deps.adminTokenPath = tmp_ / "admin.token";
    auto logger = std::make_shared<Zyrd::ZyrApi::LumoLoggerWrapper>(&Log_Level);
    handler_ = Lumo::Protocol::MakeJsonRpcHandler(
        Zyrd::ZyrApi::CreateLocalProvider([](std::function<void()> task) { task(); }, logger, deps),
        std::shared_ptr<const Lumo::L10n::Localizer>(&Zyrd::ZyrApi::CatalogueLocalizer(),
                                                     [](const Lumo::L10n::Localizer*) {}),
        logger);
    std::ifstream in(deps.adminTokenPath);
    std::getline(in, adminToken_);
  }

  // Handles one request body; returns the response.
  Lumo::Transport::HttpCallResult Send(std::string body, const std::string& token = "") {
    auto call = std::make_shared<Lumo::Transport::HttpCall>();
    call->body = std::move(body);
    if (!token.empty()) call->authorization = "Bearer " + token;
    Lumo::Transport::HttpCallResult result;
    handler_(call, [&](Lumo::Transport::HttpCallResult r) { result = std::move(r); });
    return result;
  }

  const Lumo::Transport::HttpCallHandler& Handler() const { return handler_; }
  const std::string& AdminToken() const { return adminToken_; }

 private:
  TempDir tmp_;
  Lumo::Transport::HttpCallHandler handler_;
  std::string adminToken_;
};

}  // namespace ZyrdTest
