#include "services/key_operation_impl.h"

#include "errors/error_builders.h"
#include "errors/kms_result.h"
#include "platform/util/log.h"

namespace Com::Tarsel::Orna::Kms::KeyOperationSvc {
namespace {

using Zyrd::ZyrApi::Message;

// The walk over a provider's servers shared by generate_key and decrypt.
// `attempt(index, reason)` tries one server. Returns the error to answer
// with, or null when a server succeeded.
template <typename Attempt>
::Lumo::Data::ErrorValuePtr TryServers(Zyrd::Kms::Kms& client, const std::string& provider,
                                       const char* failedLine, const char* operation,
                                       Attempt attempt) {
  uint32_t count = client.GetServerCount();
  if (count == 0) {
    Log_Level(2, "Provider %s has no key servers\n", provider.c_str());
    return Zyrd::ZyrApi::MakeError(
        {Message("com.tarsel.orna.kms." + std::string(operation) + ".error")});
  }
  Zyrd::Kms::KmsResult last = Zyrd::Kms::Ok;
  std::string name;
  for (uint32_t i = 0; i < count; ++i) {
    name.clear();
    client.GetServerName(i, name);
    std::string reason;
    last = attempt(i, reason);
    if (last == Zyrd::Kms::Ok) return nullptr;
    Log_Level(3, failedLine, provider.c_str(), name.c_str(), reason.c_str());
  }
  return Zyrd::ZyrApi::MakeError(
      {Message(Zyrd::ZyrApi::KmsErrorId(last, operation), {{"server", name}})});
}

}  // namespace

KeyOperationImpl::KeyOperationImpl(std::shared_ptr<Zyrd::State::ProviderLookup> providers,
                                   Zyrd::Stats::KeyStats& stats)
    : providers_(std::move(providers)), stats_(stats) {}

void KeyOperationImpl::generate_key(const std::string& provider, int64_t keySize,
                                    ::Lumo::AsyncResult<GeneratedKey> result) {
  const uint64_t start = stats_.NowUs();
  auto fail = [&](::Lumo::Data::ErrorValuePtr error) {
    result.SetError(std::move(error));
    stats_.Record(false, start);
  };
  if (provider.empty()) {
    Log_Level(2, "Generate key called on an empty provider\n");
    return fail(Zyrd::ZyrApi::MakeInvalidParameterError("provider"));
  }
  // The key size is the number of bytes to generate: a zero-length key is no
  // key, and a huge one would only exhaust memory.
  if (keySize < 1 || keySize > kMaxKeySize) {
    Log_Level(2, "Generate key called with an invalid key size %lld on provider %s\n",
              static_cast<long long>(keySize), provider.c_str());
    return fail(Zyrd::ZyrApi::MakeInvalidParameterError("keySize"));
  }
  std::shared_ptr<Zyrd::Kms::Kms> client = providers_->GetProvider(provider);
  if (client == nullptr) {
    Log_Level(2, "Provider %s does not exist\n", provider.c_str());
    return fail(Zyrd::ZyrApi::MakeProviderNotFoundError(provider));
  }
  GeneratedKey key;
  key.key.emplace();
  ::Lumo::Data::ErrorValuePtr error = TryServers(
      *client, provider, "GenerateKey failed on provider %s server %s %s, trying next server\n",
      "keyoperationsvc.generatekey", [&](uint32_t index, std::string& reason) {
        key.wrappedKey.clear();
        key.key->Wipe();
        return client->GenerateKey(index, static_cast<uint32_t>(keySize), *key.key, key.wrappedKey,
                                   reason);
      });
  if (error != nullptr) return fail(std::move(error));
  result.SetResult(key);
  stats_.Record(true, start);
}

void KeyOperationImpl::encrypt(::Lumo::AsyncResult<EncryptResult> result) {
  Log_Level(2, "Encrypt is not supported.\n");
  result.SetError(Zyrd::ZyrApi::MakeError({}));
}

void KeyOperationImpl::decrypt(const std::string& provider, const std::string& wrappedKey,
                               ::Lumo::AsyncResult<DecryptResult> result) {
  const uint64_t start = stats_.NowUs();
  auto fail = [&](::Lumo::Data::ErrorValuePtr error) {
    result.SetError(std::move(error));
    stats_.Record(false, start);
  };
  if (provider.empty()) {
    Log_Level(2, "Decrypt called on an empty provider\n");
    return fail(Zyrd::ZyrApi::MakeInvalidParameterError("provider"));
  }
  std::shared_ptr<Zyrd::Kms::Kms> client = providers_->GetProvider(provider);
  if (client == nullptr) {
    Log_Level(2, "Provider %s does not exist\n", provider.c_str());
    return fail(Zyrd::ZyrApi::MakeProviderNotFoundError(provider));
  }
  DecryptResult plain;
  ::Lumo::Data::ErrorValuePtr error = TryServers(
      *client, provider, "Decrypt failed on provider %s server %s %s, trying next server\n",
      "keyoperationsvc.decrypt", [&](uint32_t index, std::string& reason) {
        plain.key.Wipe();
        return client->Decrypt(index, wrappedKey, plain.key, reason);
      });
  if (error != nullptr) return fail(std::move(error));
  result.SetResult(plain);
  stats_.Record(true, start);
}

}  // namespace Com::Tarsel::Orna::Kms::KeyOperationSvc
