// The API metadata file and the containers its sections load into.
//
// One JSON file carries four sections: "cli" (command-line metadata),
// "metamodel" (services, operations, parameters, structures, enumerations),
// "authentication" (the authentication schemes each operation accepts) and
// "authorization" (the entitlements each operation needs; loaded into
// Authz::AuthzInfo, see authz.h). docs/metadata.md describes the format.
//
// A container is filled once at start-up and immutable afterwards; it may be
// shared freely across threads.
#pragma once

#include <boost/json/value.hpp>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/bindings.h"
#include "platform/lumo/errors.h"

namespace Lumo::Provider::Metadata {

// Entries of one kind, by id, in file order.
class Index {
 public:
  // False when `id` is already present.
  bool Add(const std::string& id, const boost::json::object* entry);
  const boost::json::object* Find(std::string_view id) const;
  const std::vector<std::string>& Ids() const { return ids_; }

 private:
  std::vector<std::string> ids_;
  std::map<std::string, const boost::json::object*, std::less<>> entries_;
};

// What every container shares: its component name, the section as loaded and
// the section's fingerprint (SHA-256 of its serialized text, lower-case hex).
class SectionContainer {
 public:
  virtual ~SectionContainer() = default;

  const std::string& Component() const { return component_; }
  const boost::json::object& Section() const { return section_.get_object(); }
  const std::string& Fingerprint() const { return fingerprint_; }

  // Takes `section` (the file's section as parsed) for component `component`.
  // On failure returns false and says why in `reason`; the container is then
  // unusable.
  bool Load(const std::string& component, boost::json::value section, std::string& reason);

 protected:
  // Builds the indexes over Section().
  virtual bool Index(std::string& reason) = 0;

 private:
  std::string component_;
  boost::json::value section_;
  std::string fingerprint_;
};

namespace Cli {
class MetadataContainer : public SectionContainer {
 public:
  // Keyed "<path>|<name>".
  const Metadata::Index& Namespaces() const { return namespaces_; }
  const Metadata::Index& Commands() const { return commands_; }
  static std::string Key(std::string_view path, std::string_view name);

 protected:
  bool Index(std::string& reason) override;

 private:
  Metadata::Index namespaces_;
  Metadata::Index commands_;
};
}  // namespace Cli

namespace Metamodel {
class MetadataContainer : public SectionContainer {
 public:
  const Metadata::Index& Packages() const { return packages_; }
  const Metadata::Index& Services() const { return services_; }
  // Keyed by the full method name "<service id>.<operation id>".
  const Metadata::Index& Operations() const { return operations_; }
  const Metadata::Index& Structures() const { return structures_; }
  const Metadata::Index& Enumerations() const { return enumerations_; }
  const Metadata::Index& Resources() const { return resources_; }
  const std::vector<std::string>& HiddenServices() const { return hidden_; }

 protected:
  bool Index(std::string& reason) override;

 private:
  bool IndexTypes(const boost::json::object& package, std::string& reason);
  bool IndexServices(const boost::json::object& package, std::string& reason);
  bool CheckMembers(const boost::json::object& owner, std::string_view list,
                    const std::string& where, std::string& reason) const;
  bool CheckType(const boost::json::value& type, std::string& reason) const;

  Metadata::Index packages_, services_, operations_, structures_, enumerations_, resources_;
  std::vector<std::string> hidden_;
};
}  // namespace Metamodel

namespace Authentication {
class MetadataContainer : public SectionContainer {
 public:
  const Metadata::Index& Packages() const { return packages_; }
  const Metadata::Index& Services() const { return services_; }
  // Keyed by the full method name.
  const Metadata::Index& Operations() const { return operations_; }

 protected:
  bool Index(std::string& reason) override;

 private:
  Metadata::Index packages_, services_, operations_;
};
}  // namespace Authentication

namespace ProviderHelper {

// Each reads the metadata file at `path` and loads its section into
// `container`, which must be named `component`. Returns null on success, else
// an error value whose message says what failed.
Data::ErrorValuePtr LoadCliMetadataFile(const std::string& path, const std::string& component,
                                        Cli::MetadataContainer& container);
Data::ErrorValuePtr LoadMetamodelMetadataFile(const std::string& path, const std::string& component,
                                              Metamodel::MetadataContainer& container);
Data::ErrorValuePtr LoadAuthnMetadataFile(const std::string& path, const std::string& component,
                                          Authentication::MetadataContainer& container);

}  // namespace ProviderHelper

// The framework's metadata services answering from the containers:
// "com.tarsel.lumo.metadata.cli.*", "...metamodel.*", "...authentication.*".
std::vector<ApiInterfacePtr> CliInterfaces(std::shared_ptr<const Cli::MetadataContainer> c);
std::vector<ApiInterfacePtr> MetamodelInterfaces(
    std::shared_ptr<const Metamodel::MetadataContainer> c);
std::vector<ApiInterfacePtr> AuthnInterfaces(
    std::shared_ptr<const Authentication::MetadataContainer> c);

}  // namespace Lumo::Provider::Metadata
