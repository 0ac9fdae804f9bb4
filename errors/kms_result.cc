#include "errors/kms_result.h"

#include "platform/util/panic.h"

namespace Zyrd::ZyrApi {

std::string KmsErrorId(uint32_t code, const std::string& operation) {
  using namespace Zyrd::Kms;
  switch (code) {
    case Ok:
      NOT_REACHED();
    case MasterKeyNotFound:
      return "com.tarsel.orna.kms.master_key_not_found";
    case MasterKeyPreActive:
      return "com.tarsel.orna.kms.master_key_pre_active";
    case MasterKeyUnusableForEncryption:
      return "com.tarsel.orna.kms.master_key_unusable_for_encryption";
    case MasterKeyUnusable:
      return "com.tarsel.orna.kms.master_key_unusable";
    case MasterKeyLengthUnsupported:
      return "com.tarsel.orna.kms.master_key_length_unsupported";
    case KeyServerTimeout:
      return "com.tarsel.orna.kms.key_server_timeout";
    case KeyServerCommunicationError:
      return "com.tarsel.orna.kms.key_server_communication_error";
    case CertFormatUnknown:
      return "com.tarsel.orna.kms.cert_format_unknown";
    case ServerCertNotRequired:
      return "com.tarsel.orna.kms.server_cert_not_required";
    case NoVersionsFound:
      return "com.tarsel.orna.kms.no_versions_found";
    case NoSupportedVersions:
      return "com.tarsel.orna.kms.no_supported_versions";
    case CryptoFailure:
    case EncodeFailure:
    case MetadataFailure:
    case KmipFailure:
    case OtherFailure:
      return "com.tarsel.orna.kms." + operation + ".error";
    default:
      return "";
  }
}

}  // namespace Zyrd::ZyrApi
