// The key operation service "com.tarsel.orna.kms.key_operation": its records,
// its interface and its binder.
//
//   generate_key(provider: string, keySize: long) -> GeneratedKey
//   encrypt(provider: string, plaintext: string)  -> EncryptResult (refused)
//   decrypt(provider: string, wrappedKey: string) -> DecryptResult
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <boost/json/value_to.hpp>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/lumo/async_result.h"
#include "platform/lumo/bindings.h"
#include "platform/util/secure_buffer.h"

namespace Com::Tarsel::Orna::Kms::KeyOperationSvc {

inline constexpr const char* kServiceId = "com.tarsel.orna.kms.key_operation";

// A new data key: its wrapped-key text and the key itself (Base64).
struct GeneratedKey {
  std::string wrappedKey;
  std::optional<Groundwork::SecureString> key;
};

struct DecryptResult {
  Groundwork::SecureString key;  // Base64 of the unwrapped key bytes
};

// Declared by the interface; never produced.
struct EncryptResult {
  std::string wrappedKey;
};

void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const GeneratedKey& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const DecryptResult& in);
void tag_invoke(boost::json::value_from_tag, boost::json::value& out, const EncryptResult& in);

struct GenerateKeyInput {
  std::string provider;
  int64_t keySize = 0;
};
struct DecryptInput {
  std::string provider;
  std::string wrappedKey;
};
// encrypt is refused whatever it is given: its inputs are taken as they come.
struct EncryptInput {};

GenerateKeyInput tag_invoke(boost::json::value_to_tag<GenerateKeyInput>,
                            const boost::json::value& in);
DecryptInput tag_invoke(boost::json::value_to_tag<DecryptInput>, const boost::json::value& in);
EncryptInput tag_invoke(boost::json::value_to_tag<EncryptInput>, const boost::json::value& in);

class AsyncServiceInterface {
 public:
  virtual ~AsyncServiceInterface() = default;

  // Each operation completes its result exactly once.
  virtual void generate_key(const std::string& provider, int64_t keySize,
                            ::Lumo::AsyncResult<GeneratedKey> result) = 0;
  virtual void encrypt(::Lumo::AsyncResult<EncryptResult> result) = 0;
  virtual void decrypt(const std::string& provider, const std::string& wrappedKey,
                       ::Lumo::AsyncResult<DecryptResult> result) = 0;
};

struct AsyncServiceBinder {
  static ::Lumo::Provider::ApiInterfacePtr BindImplementation(
      std::shared_ptr<AsyncServiceInterface> impl);
};

}  // namespace Com::Tarsel::Orna::Kms::KeyOperationSvc
