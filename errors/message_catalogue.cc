#include "errors/message_catalogue.h"

#include "platform/util/panic.h"

namespace Zyrd::ZyrApi {

const std::array<CatalogueEntry, 38> kMessageCatalogue = {{
    {"com.tarsel.orna.kms.authentication.invalid_token", "Invalid Token."},
    {"com.tarsel.orna.kms.cert_format_unknown", "Unable to determine the certificate format."},
    {"com.tarsel.orna.kms.invalid_config_value",
     "Invalid value is found for {parameter} in the configuration."},
    {"com.tarsel.orna.kms.key_server_timeout",
     "Timed out waiting for response from key server {server}."},
    {"com.tarsel.orna.kms.key_server_communication_error",
     "Unable to communicate with key server {server}."},
    {"com.tarsel.orna.kms.keyoperationsvc.generatekey.error", "Unable to generate a new key."},
    {"com.tarsel.orna.kms.keyoperationsvc.decrypt.error", "Unable to decrypt the ciphertext."},
    {"com.tarsel.orna.kms.master_key_not_found",
     "Unable to find the master key on key server {server}."},
    {"com.tarsel.orna.kms.master_key_pre_active",
     "The master key on key server {server} is in pre-active state and needs to be activated."},
    {"com.tarsel.orna.kms.master_key_unusable_for_encryption",
     "The master key on key server {server} is deactivated or compromised. It can be used for "
     "decryption only and cannot be used for encryption."},
    {"com.tarsel.orna.kms.master_key_unusable",
     "The master key on key server {server} is destroyed or destroyed-compromised and cannot be "
     "used for encryption or decryption."},
    {"com.tarsel.orna.kms.master_key_length_unsupported",
     "The master key length is not supported by key server {server}."},
    {"com.tarsel.orna.kms.no_versions_found",
     "Unable to determine the versions supported by key server {server}."},
    {"com.tarsel.orna.kms.no_supported_versions",
     "No known version is being supported by key server {server}."},
    {"com.tarsel.orna.kms.providers.already_exists", "The provider '{provider}' already exists."},
    {"com.tarsel.orna.kms.providers.config_store_error", "Unable to update configuration."},
    {"com.tarsel.orna.kms.providers.crypto_error.create",
     "Unable to create client certificate or key."},
    {"com.tarsel.orna.kms.providers.csr_error", "Certificate signing request failed."},
    {"com.tarsel.orna.kms.providers.firewall_error", "Unable to update firewall."},
    {"com.tarsel.orna.kms.providers.invalid_argument",
     "A specified parameter was not correct: '{parameter}'."},
    {"com.tarsel.orna.kms.providers.not_found", "The provider '{provider}' does not exist."},
    {"com.tarsel.orna.kms.providers.private_key_mismatch",
     "Client certificate and private key do not match."},
    {"com.tarsel.orna.kms.providers.private_key_unknown",
     "Client certificate does not correspond to a certificate signing request, private key must "
     "be supplied."},
    {"com.tarsel.orna.kms.providers.server_certs.limit_error",
     "Number of server certificates cannot exceed {num}."},
    {"com.tarsel.orna.kms.raw_config.config_store_error", "Unable to update configuration."},
    {"com.tarsel.orna.kms.raw_config.compress_error", "Failed to compress the configuration."},
    {"com.tarsel.orna.kms.raw_config.unknown_infotype",
     "Unknown info type requested for raw config."},
    {"com.tarsel.orna.kms.providers.server_certificates.remotesvc.list.error",
     "Unable to get certificate from the server {server}."},
    {"com.tarsel.orna.kms.server_cert_not_required",
     "Key server {server} did not request a certificate."},
    {"com.tarsel.orna.kms.providers.server_certificate.failed",
     "Unable to fetch and check the expiry of server certificate. Reason: {reason}"},
    {"com.tarsel.orna.kms.providers.statussvc.client_certificate_expiring",
     "Client certificate is expiring within {days} days."},
    {"com.tarsel.orna.kms.providers.statussvc.client_certificate_unknown_expiry",
     "Unable to fetch and check the expiry of client certificate."},
    {"com.tarsel.orna.kms.providers.statussvc.client_not_trusting_server",
     "Client is unable to trust the server {server}."},
    {"com.tarsel.orna.kms.providers.statussvc.get.error",
     "Unable to get status information from server {server}."},
    {"com.tarsel.orna.kms.providers.statussvc.server_certificate_expiring",
     "Server certificate is expiring within {days} days."},
    {"com.tarsel.orna.kms.providers.statussvc.server_certificate_unknown_expiry",
     "Unable to fetch and check the expiry of server certificate of server {server}."},
    {"com.tarsel.orna.kms.providers.statussvc.server_not_trusting_client",
     "Server {server} is unable to trust the client."},
    {"com.tarsel.orna.kms.providers.statussvc.trusted_server_certificates.unknown",
     "Unable to find trusted server certificates."},
}};

std::string ResolveMessage(const std::string& id, const std::string& /*locale*/) {
  for (const auto& entry : kMessageCatalogue) {
    if (entry.id == id) return std::string(entry.text);
  }
  NOT_REACHED();
}

}  // namespace Zyrd::ZyrApi
