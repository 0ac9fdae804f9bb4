// KmipKms: the master key (cache, retrieval, state checks) and the two key
// operations that use it.
#include <openssl/crypto.h>
#include <openssl/rand.h>

#include "kms/kmip_kms.h"
#include "platform/kmip/qlkmipsimple.h"
#include "platform/ssl/aes_gcm.h"
#include "platform/util/base64.h"
#include "platform/util/log.h"
#include "platform/zyrcommon/kmip_metadata_parser.h"

namespace Zyrd::Kms {
namespace {

using Zyr::KeyProviders::Metadata::KmipMetadataParser;

constexpr const char* kGetKey = "Get, Object, Id=%s";
constexpr const char* kGetState = "Get, Attributes, Id=%s, Names=State";

}  // namespace

KmsResult CheckKeyState(int32_t state, std::string& reason) {
  switch (state) {
    case 1:
      reason = "The Key is in pre-active state and needs to be activated";
      return MasterKeyPreActive;
    case 3:
    case 4:
      reason = "The key is in deactivated or compromised state";
      return MasterKeyUnusableForEncryption;
    case 5:
    case 6:
      reason = "The key is in destroyed or destroyed compromised state";
      return MasterKeyUnusable;
    case kKeyStateUnknown:
      reason = "The key state is unknown";
      return KmipFailure;
    default:
      return Ok;
  }
}

KmsResult CheckMasterKey(size_t length, int32_t state, MasterKeyFlags& flags,
                         std::string& reason) {
  flags = {};
  if (length == 0) {
    reason = "Key not found";
    return MasterKeyNotFound;
  }
  flags.found = true;
  if (KmsResult r = CheckKeyState(state, reason); r != Ok) return r;
  flags.usable = true;
  for (int bits : kSupportedKeySizes) {
    if (static_cast<size_t>(bits) == length * 8) {
      flags.sizeSupported = true;
      return Ok;
    }
  }
  reason = "Key size " + std::to_string(length * 8) + " bits is not in supported key sizes ";
  for (size_t i = 0; i < std::size(kSupportedKeySizes); ++i) {
    if (i > 0) reason += ", ";
    reason += std::to_string(kSupportedKeySizes[i]);
  }
  return MasterKeyLengthUnsupported;
}

KmsResult KmipKms::GetKeyState(qlc_session* session, const std::string& keyId, int32_t& state,
                               std::string& reason) {
  qlc_result* result = nullptr;
  KmsResult r = Perform(session, keyId, kGetState, reason, &result);
  if (r != Ok) return r;
  int value = kKeyStateUnknown;
  int m = qlc_value_of("Attributes/State", result, "d", &value);
  if (m != 0) {
    Log_Level(3, "Failed to find key state in the response %d\n", m);
    reason = qlc_explain(result);
    state = kKeyStateUnknown;
  } else {
    state = value;
  }
  qlc_release(result);
  return MapKmipError(m);
}

// One read of the configured master key, and those who wait for it.
struct KmipKms::KeyRead {
  bool done = false;
  KmsResult result = Ok;
  Groundwork::SecureBytes key;
  int32_t state = kKeyStateUnknown;
  std::string reason;
};

KmsResult KmipKms::GetMasterKey(uint32_t server, const std::string& keyId, bool refreshState,
                                Groundwork::SecureBytes& key, int32_t& state, std::string& reason) {
  const char* provider = info_->name.c_str();
  state = kKeyStateUnknown;
  if (!HasServer(server, reason)) return OtherFailure;
  const bool configured = keyId == info_->masterKeyId;
  if (configured) {
    UserLock::ReadGuard guard(*lock_);
    if (!cachedKey_.empty()) {
      key = cachedKey_;
      if (!refreshState && cachedState_ != kKeyStateUnknown) {
        state = cachedState_;
        Log_Level(6, "Provider %s using cached key and state\n", provider);
        return Ok;
      }
      Log_Level(6, "Provider %s using cached key\n", provider);
    }
  }
  if (configured && !refreshState && key.empty()) {
    return ReadSharedMasterKey(server, key, state, reason);
  }
  return ReadMasterKey(server, keyId, key, state, reason);
}

KmsResult KmipKms::ReadSharedMasterKey(uint32_t server, Groundwork::SecureBytes& key,
                                       int32_t& state, std::string& reason) {
  std::shared_ptr<KeyRead> read;
  bool reader = false;
  {
    std::lock_guard<std::mutex> guard(readsMutex_);
    std::shared_ptr<KeyRead>& slot = reads_[server];
    if (!slot) {
      slot = std::make_shared<KeyRead>();
      reader = true;
    }
    read = slot;
  }
  if (reader) {
    read->result = ReadMasterKey(server, info_->masterKeyId, read->key, read->state, read->reason);
    // Kept under the rules of a status refresh: a key found and not destroyed.
    if (read->result == Ok && read->state != kKeyStateUnknown && !IsKeyDestroyed(read->state)) {
      UserLock::WriteGuard guard(*lock_);
      if (cachedKey_.empty()) {
        cachedKey_ = read->key;
        cachedState_ = read->state;
      }
    }
    {
      std::lock_guard<std::mutex> guard(readsMutex_);
      read->done = true;
      reads_.erase(server);
    }
    readDone_.notify_all();
  } else {
    Log_Level(6, "Provider %s waiting for the master key read in flight\n", info_->name.c_str());
    std::unique_lock<std::mutex> guard(readsMutex_);
    readDone_.wait(guard, [&] { return read->done; });
  }
  key = read->key;
  state = read->state;
  reason = read->reason;
  return read->result;
}

KmsResult KmipKms::ReadMasterKey(uint32_t server, const std::string& keyId,
                                 Groundwork::SecureBytes& key, int32_t& state,
                                 std::string& reason) {
  const char* provider = info_->name.c_str();
  qlc_session* session = nullptr;
  KmsResult r = Connect(session, server, reason);
  if (r != Ok) {
    OPENSSL_cleanse(key.data(), key.size());
  } else if (!key.empty()) {
    Log_Level(6, "Provider %s getting key state from server\n", provider);
    r = GetKeyState(session, keyId, state, reason);
  } else {
    Log_Level(6, "Provider %s getting key from server\n", provider);
    qlc_result* result = nullptr;
    r = Perform(session, keyId, kGetKey, reason, &result);
    if (r == Ok) {
      unsigned char* bytes = nullptr;
      int length = 0;
      int m = qlc_value_of("Symmetric_Key/Key", result, "bs", &bytes, &length);
      if (m != 0) {
        Log_Level(3, "Failed to find key in the response %d\n", m);
        reason = qlc_explain(result);
        qlc_release(result);
        r = MapKmipError(m);
      } else {
        key.assign(bytes, bytes + (length > 0 ? length : 0));
        OPENSSL_cleanse(bytes, static_cast<size_t>(length > 0 ? length : 0));
        qlc_free(bytes);
        qlc_release(result);
        r = GetKeyState(session, keyId, state, reason);
      }
    }
  }
  if (session != nullptr) qlc_disconnect_key_manager(session);

  if (r == KmipFailure) {
    Log_Level(3, "Overriding the result to NotFound for server %s of provider %s\n",
              ServerName(server).c_str(), provider);
    r = MasterKeyNotFound;
  }
  return r;
}

KmsResult KmipKms::GenerateKey(uint32_t server, uint32_t keyLength,
                               Groundwork::SecureString& plainKey, std::string& wrappedKey,
                               std::string& reason) {
  if (!HasServer(server, reason)) return OtherFailure;
  const std::string& keyId = info_->masterKeyId;
  Groundwork::SecureBytes masterKey;
  int32_t state = kKeyStateUnknown;
  KmsResult r = GetMasterKey(server, keyId, false, masterKey, state, reason);
  if (r == Ok) r = CheckKeyState(state, reason);
  if (r != Ok) {
    Groundwork::Wipe(masterKey);
    Log_Level(2,
              "Failed to generate key. Could not fetch master key or it is not usable. Key %s, "
              "provider %s, server %s, reason %s\n",
              keyId.c_str(), info_->name.c_str(), ServerName(server).c_str(), reason.c_str());
    return r;
  }

  Groundwork::SecureBytes dataKey(keyLength);
  if (RAND_bytes(dataKey.data(), static_cast<int>(dataKey.size())) != 1) {
    reason = "Failed to generate random bytes";
    Log_Level(2, "Generate key failed, %s\n", reason.c_str());
    return CryptoFailure;
  }
  std::vector<uint8_t> iv, ciphertext, tag;
  bool sealed =
      Kestrel::Common::SslUtils::AesGcmEncrypt(dataKey, masterKey, {}, iv, ciphertext, tag);
  Groundwork::Wipe(masterKey);
  if (!sealed) {
    reason = "Failed to encrypt data key";
    Log_Level(2, "Generate key failed, %s\n", reason.c_str());
    return CryptoFailure;
  }
  plainKey = Groundwork::Base64EncodeSecret(dataKey.data(), dataKey.size());
  if (!KmipMetadataParser::Add(keyId, iv, tag, ciphertext.data(), ciphertext.size(),
                               wrappedKey)) {
    reason = "Failed to add metadata";
    Log_Level(2, "Generate key failed, %s\n", reason.c_str());
    return MetadataFailure;
  }
  Log_Level(0, "Operation : 'GenerateKey', masterKeyId : '%s'\n", keyId.c_str());
  return Ok;
}

KmsResult KmipKms::Decrypt(uint32_t server, const std::string& wrappedKey,
                           Groundwork::SecureString& plainKey, std::string& reason) {
  if (!HasServer(server, reason)) return OtherFailure;
  KmipMetadataParser parser;
  if (!parser.Parse(wrappedKey)) {
    reason = "Failed to read metadata";
    return MetadataFailure;
  }
  std::string keyId(reinterpret_cast<const char*>(parser.GetKeyId()), parser.GetKeyIdSize());
  Groundwork::SecureBytes masterKey;
  int32_t state = kKeyStateUnknown;
  KmsResult r = GetMasterKey(server, keyId, false, masterKey, state, reason);
  if (r == Ok) r = CheckKeyState(state, reason);
  const char* configuredKey = info_->masterKeyId.c_str();
  if (r == MasterKeyUnusableForEncryption) {
    Log_Level(3,
              "Proceeding to decrpt with a key which is deactivated or compromised. Key %s, "
              "provider %s, server %s\n",
              configuredKey, info_->name.c_str(), ServerName(server).c_str());
  } else if (r != Ok) {
    Groundwork::Wipe(masterKey);
    Log_Level(2,
              "Failed to decrypt. Could not fetch master key or it is not usable. Key %s, "
              "provider %s, server %s, reason %s\n",
              configuredKey, info_->name.c_str(), ServerName(server).c_str(), reason.c_str());
    return r;
  }

  Groundwork::SecureBytes plaintext;
  bool opened = Kestrel::Common::SslUtils::AesGcmDecrypt(
      {parser.GetCiphertext(), parser.GetCiphertextSize()}, masterKey,
      {parser.GetIv(), parser.GetIvSize()}, {}, {parser.GetMac(), parser.GetMacSize()}, plaintext);
  Groundwork::Wipe(masterKey);
  if (!opened) {
    reason = "Failed to decrypt ciphertext";
    Log_Level(2, "Decrypt failed, %s\n", reason.c_str());
    return CryptoFailure;
  }
  plainKey = Groundwork::Base64EncodeSecret(plaintext.data(), plaintext.size());
  Log_Level(0, "Operation : 'Decrypt'\n");
  return Ok;
}

}  // namespace Zyrd::Kms
