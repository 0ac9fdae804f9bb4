#include <gtest/gtest.h>

#include <set>

#include "errors/error_builders.h"
#include "errors/kms_result.h"
#include "errors/message_catalogue.h"

namespace {

using namespace Zyrd::ZyrApi;
using Lumo::Data::ErrorType;

TEST(Catalogue, HasThirtyEightDistinctIdentifiersInOrder) {
  ASSERT_EQ(kMessageCatalogue.size(), 38u);
  std::set<std::string_view> ids;
  for (const auto& e : kMessageCatalogue) ids.insert(e.id);
  EXPECT_EQ(ids.size(), 38u);
  EXPECT_EQ(kMessageCatalogue.front().id, "com.tarsel.orna.kms.authentication.invalid_token");
  EXPECT_EQ(kMessageCatalogue[15].id, "com.tarsel.orna.kms.providers.config_store_error");
  EXPECT_EQ(kMessageCatalogue[24].id, "com.tarsel.orna.kms.raw_config.config_store_error");
  EXPECT_EQ(kMessageCatalogue.back().id,
            "com.tarsel.orna.kms.providers.statussvc.trusted_server_certificates.unknown");
}

TEST(Catalogue, TemplatesKeepTheirExactText) {
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.providers.invalid_argument", "en_US"),
            "A specified parameter was not correct: '{parameter}'.");
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.providers.server_certificate.failed", ""),
            "Unable to fetch and check the expiry of server certificate. Reason: {reason}");
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.master_key_unusable_for_encryption", ""),
            "The master key on key server {server} is deactivated or compromised. It can be used "
            "for decryption only and cannot be used for encryption.");
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.providers.private_key_unknown", ""),
            "Client certificate does not correspond to a certificate signing request, private key "
            "must be supplied.");
  // Two identifiers share one text.
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.raw_config.config_store_error", ""),
            "Unable to update configuration.");
  EXPECT_EQ(ResolveMessage("com.tarsel.orna.kms.providers.config_store_error", ""),
            "Unable to update configuration.");
}

TEST(CatalogueDeathTest, UnknownIdentifierStopsTheProcess) {
  EXPECT_DEATH(ResolveMessage("com.tarsel.orna.kms.nope", "en_US"),
               "NOT_REACHED errors/message_catalogue:[0-9]+");
}

TEST(KmsErrorId, EveryCodeMapsAsTabled) {
  const std::string op = "keyoperationsvc.generatekey";
  const std::pair<uint32_t, const char*> expected[] = {
      {1, "com.tarsel.orna.kms.master_key_not_found"},
      {2, "com.tarsel.orna.kms.master_key_pre_active"},
      {3, "com.tarsel.orna.kms.master_key_unusable_for_encryption"},
      {4, "com.tarsel.orna.kms.master_key_unusable"},
      {5, "com.tarsel.orna.kms.master_key_length_unsupported"},
      {6, "com.tarsel.orna.kms.keyoperationsvc.generatekey.error"},
      {7, "com.tarsel.orna.kms.keyoperationsvc.generatekey.error"},
      {8, "com.tarsel.orna.kms.keyoperationsvc.generatekey.error"},
      {9, "com.tarsel.orna.kms.key_server_timeout"},
      {10, "com.tarsel.orna.kms.key_server_communication_error"},
      {11, "com.tarsel.orna.kms.cert_format_unknown"},
      {12, "com.tarsel.orna.kms.server_cert_not_required"},
      {13, "com.tarsel.orna.kms.no_versions_found"},
      {14, "com.tarsel.orna.kms.no_supported_versions"},
      {15, "com.tarsel.orna.kms.keyoperationsvc.generatekey.error"},
      {16, "com.tarsel.orna.kms.keyoperationsvc.generatekey.error"},
  };
  for (const auto& [code, id] : expected) {
    EXPECT_EQ(KmsErrorId(code, op), id) << code;
    // Every identifier a code can produce is in the catalogue.
    EXPECT_FALSE(ResolveMessage(KmsErrorId(code, op), "").empty());
  }
  EXPECT_EQ(KmsErrorId(1, "anything"), "com.tarsel.orna.kms.master_key_not_found");
  EXPECT_EQ(KmsErrorId(15, "providers.statussvc.get"),
            "com.tarsel.orna.kms.providers.statussvc.get.error");
  EXPECT_EQ(KmsErrorId(8, "providers.server_certificates.remotesvc.list"),
            "com.tarsel.orna.kms.providers.server_certificates.remotesvc.list.error");
  EXPECT_EQ(KmsErrorId(17, op), "");
  EXPECT_EQ(KmsErrorId(0xffffffffu, op), "");
}

TEST(KmsErrorIdDeathTest, CodeZeroIsAProgrammingError) {
  EXPECT_DEATH(KmsErrorId(0, "keyoperationsvc.decrypt"), "NOT_REACHED errors/kms_result:[0-9]+");
}

TEST(Builders, SetClassTypeAndMessages) {
  auto msg = Message("com.tarsel.orna.kms.providers.invalid_argument", {{"parameter", "provider"}});
  EXPECT_EQ(msg.defaultMessage, "A specified parameter was not correct: 'provider'.");
  auto invalid = MakeInvalidArgumentError({msg});
  EXPECT_EQ(invalid->Type(), ErrorType::kInvalidArgument);
  EXPECT_EQ(invalid->Messages(), std::vector{msg});
  const std::pair<Lumo::Data::ErrorValuePtr, const char*> classes[] = {
      {invalid, "invalid_argument"},
      {MakeError({}), "error"},
      {MakeNotFoundError({}), "not_found"},
      {MakeUnsupportedError({}), "unsupported"},
      {MakeUnauthenticatedError({}), "unauthenticated"}};
  for (const auto& [error, name] : classes) {
    EXPECT_EQ(error->Name(), std::string("com.tarsel.lumo.std.errors.") + name);
  }
  EXPECT_TRUE(MakeError({})->Messages().empty());
}

// 1 already exists and 3 not found keep their messages; every other status
// is the generic configuration error.
TEST(MakeConfigStoreError, MapsStatusesToClasses) {
  auto notFound = Message("com.tarsel.orna.kms.providers.not_found", {{"provider", "p1"}});
  EXPECT_EQ(notFound.defaultMessage, "The provider 'p1' does not exist.");
  auto e3 = MakeConfigStoreError(3, {notFound});
  EXPECT_EQ(e3->Name(), "com.tarsel.lumo.std.errors.not_found");
  EXPECT_EQ(e3->Messages(), std::vector{notFound});
  auto e1 = MakeConfigStoreError(
      1, {Message("com.tarsel.orna.kms.providers.already_exists", {{"provider", "p1"}})});
  EXPECT_EQ(e1->Name(), "com.tarsel.lumo.std.errors.already_exists");
  EXPECT_EQ(e1->Messages()[0].defaultMessage, "The provider 'p1' already exists.");
  for (int status : {2, 7, 0}) {
    auto e = MakeConfigStoreError(status, {notFound});
    EXPECT_EQ(e->Name(), "com.tarsel.lumo.std.errors.error") << status;
    ASSERT_EQ(e->Messages().size(), 1u);
    EXPECT_EQ(e->Messages()[0].id, "com.tarsel.orna.kms.providers.config_store_error");
    EXPECT_TRUE(e->Messages()[0].args.empty());
  }
  EXPECT_EQ(MakeConfigStoreError(3)->Messages().size(), 0u);
}

}  // namespace
