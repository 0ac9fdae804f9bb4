// KeyOperationImpl: new data keys and the unwrapping of wrapped keys for a
// provider, trying the provider's key servers in configured order until one
// succeeds. Stateless apart from its collaborators; any number of calls may
// run at once.
#pragma once

#include <memory>

#include "daemon/stats.h"
#include "services/key_operation_svc.h"
#include "state/provider_lookup.h"

namespace Com::Tarsel::Orna::Kms::KeyOperationSvc {

class KeyOperationImpl : public AsyncServiceInterface {
 public:
  // Largest data key, in bytes, that generate_key makes.
  static constexpr int64_t kMaxKeySize = 65535;

  // `providers` finds each provider's key server client; `stats` counts every
  // generate_key and decrypt. Both must outlive this object.
  KeyOperationImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers,
                   Zyrd::Stats::KeyStats& stats);

  // Refuses an empty provider (invalid_argument "provider") and a key size
  // outside 1..65535 (invalid_argument "keySize") before any server is
  // contacted; an unknown provider is not_found; otherwise the first server
  // that succeeds answers, and when all fail the last server's error does.
  void generate_key(const std::string& provider, int64_t keySize,
                    ::Lumo::AsyncResult<GeneratedKey> result) override;
  // Always the bare error: encryption is not offered.
  void encrypt(::Lumo::AsyncResult<EncryptResult> result) override;
  void decrypt(const std::string& provider, const std::string& wrappedKey,
               ::Lumo::AsyncResult<DecryptResult> result) override;

 private:
  std::shared_ptr<Zyrd::State::ProviderLookup> providers_;
  Zyrd::Stats::KeyStats& stats_;
};

}  // namespace Com::Tarsel::Orna::Kms::KeyOperationSvc
