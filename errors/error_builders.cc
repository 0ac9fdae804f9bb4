#include "errors/error_builders.h"

#include "errors/message_catalogue.h"

namespace Zyrd::ZyrApi {
namespace {

namespace StdErrors = Com::Tarsel::Lumo::Std::Errors;

// The localizer the builders adapt errors with: English, then the C locale,
// in UTC.
const Lumo::L10n::Localizer& BuilderLocalizer() {
  static const Lumo::L10n::Localizer localizer(
      Lumo::L10n::LocaleHelpers::MakeLanguagePreference({"en_US", "C"}), ResolveMessage,
      Lumo::L10n::TimezoneSpec{"Etc/UTC"});
  return localizer;
}

template <typename NativeError>
Lumo::Data::ErrorValuePtr Build(const Messages& messages) {
  NativeError native;
  native.messages = messages;
  native.errorType = NativeError::kType;
  return Lumo::Data::NativeToValueAdapter::Adapt(native, BuilderLocalizer());
}

}  // namespace

Lumo::Data::ErrorValuePtr MakeError(const Messages& m) { return Build<StdErrors::Error>(m); }
Lumo::Data::ErrorValuePtr MakeNotFoundError(const Messages& m) {
  return Build<StdErrors::NotFound>(m);
}
Lumo::Data::ErrorValuePtr MakeInvalidArgumentError(const Messages& m) {
  return Build<StdErrors::InvalidArgument>(m);
}
Lumo::Data::ErrorValuePtr MakeUnsupportedError(const Messages& m) {
  return Build<StdErrors::Unsupported>(m);
}
Lumo::Data::ErrorValuePtr MakeUnauthenticatedError(const Messages& m) {
  return Build<StdErrors::Unauthenticated>(m);
}

Lumo::Data::ErrorValuePtr MakeConfigStoreError(int status, const Messages& messages) {
  switch (status) {
    case 1:
      return Build<StdErrors::AlreadyExists>(messages);
    case 3:
      return Build<StdErrors::NotFound>(messages);
    default:
      return MakeError({Message("com.tarsel.orna.kms.providers.config_store_error")});
  }
}

Lumo::Data::ErrorValuePtr MakeConfigStoreError(int status) {
  return MakeConfigStoreError(status, {});
}

Lumo::Data::ErrorValuePtr MakeInvalidParameterError(const std::string& parameter) {
  return MakeInvalidArgumentError(
      {Message("com.tarsel.orna.kms.providers.invalid_argument", {{"parameter", parameter}})});
}

Lumo::Data::ErrorValuePtr MakeProviderNotFoundError(const std::string& provider) {
  return MakeNotFoundError(
      {Message("com.tarsel.orna.kms.providers.not_found", {{"provider", provider}})});
}

Lumo::Data::ErrorValuePtr MakeProviderStoreError(int status, const std::string& provider) {
  const char* id = status == 1 ? "com.tarsel.orna.kms.providers.already_exists"
                               : "com.tarsel.orna.kms.providers.not_found";
  return MakeConfigStoreError(status, {Message(id, {{"provider", provider}})});
}

const Lumo::L10n::Localizer& CatalogueLocalizer() {
  static const Lumo::L10n::Localizer localizer({"en_US"}, ResolveMessage);
  return localizer;
}

Lumo::L10n::LocalizableMessage Message(const std::string& id,
                                       const std::vector<Lumo::MsgArgument>& args) {
  Lumo::NamedMessageBuilder builder(id);
  for (const auto& a : args) builder.Arg(a.name, a.value);
  return CatalogueLocalizer().Localize(builder);
}

}  // namespace Zyrd::ZyrApi
