// Result codes of the key server client. 0 is success; every failure is paired
// with a reason text that goes to the log only.
#pragma once

#include <cstdint>
#include <string>

namespace Zyrd::Kms {

enum KmsResult : uint32_t {
  Ok = 0,
  MasterKeyNotFound = 1,               // absent, empty, or not obtainable
  MasterKeyPreActive = 2,              // KMIP state Pre-Active
  MasterKeyUnusableForEncryption = 3,  // Deactivated or Compromised
  MasterKeyUnusable = 4,               // Destroyed or Destroyed Compromised
  MasterKeyLengthUnsupported = 5,
  CryptoFailure = 6,     // random bytes, AES-GCM
  EncodeFailure = 7,     // Base64
  MetadataFailure = 8,   // wrapped-key text
  KeyServerTimeout = 9,  // KMIP library error 105
  KeyServerCommunicationError = 10,  // KMIP library error 75
  CertFormatUnknown = 11,
  ServerCertNotRequired = 12,
  NoVersionsFound = 13,
  NoSupportedVersions = 14,
  KmipFailure = 15,
  OtherFailure = 16,
};

}  // namespace Zyrd::Kms

namespace Zyrd::ZyrApi {

// The message identifier for a non-zero result. `operation` names the API
// operation ("keyoperationsvc.generatekey") for the results that have no
// identifier of their own (6, 7, 8, 15, 16): they give
// "com.tarsel.orna.kms.<operation>.error". Codes above 16 give "". Code 0 is
// a programming error and stops the process.
std::string KmsErrorId(uint32_t code, const std::string& operation);

}  // namespace Zyrd::ZyrApi
