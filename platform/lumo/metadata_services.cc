// The framework's metadata services: each answers a query from a metadata
// container loaded at start-up.
#include "platform/lumo/core_messages.h"
#include "platform/lumo/metadata.h"

namespace Lumo::Provider::Metadata {
namespace {

using Args = std::vector<std::optional<std::string>>;
using Core::MethodResult;

constexpr std::string_view kCli = "com.tarsel.lumo.metadata.cli.";
constexpr std::string_view kMetamodel = "com.tarsel.lumo.metadata.metamodel.";
constexpr std::string_view kAuthn = "com.tarsel.lumo.metadata.authentication.";

ApiInterfacePtr Service(std::string_view prefix, std::string_view name,
                        std::vector<BoundOperation> ops) {
  return std::make_shared<const ApiInterface>(
      ApiInterface{std::string(prefix) + std::string(name), std::move(ops)});
}

MethodResult IdList(const std::vector<std::string>& ids) {
  boost::json::array out;
  out.reserve(ids.size());
  for (const auto& id : ids) out.emplace_back(id);
  return MethodResult::Output(std::move(out));
}

// The entry `id` of `index`, or not_found naming `what`.
MethodResult Entry(const Index& index, std::string_view what, const std::string& id) {
  const boost::json::object* entry = index.Find(id);
  if (entry == nullptr) return MethodResult::Error(Core::MetadataNotFoundError(what, id));
  return MethodResult::Output(*entry);
}

// The ids of the list `list` (entries keyed `key`) inside `owner`.
std::vector<std::string> MemberIds(const boost::json::object& owner, std::string_view list,
                                   std::string_view key) {
  std::vector<std::string> ids;
  const boost::json::value* v = owner.if_contains(list);
  if (v == nullptr || !v->is_array()) return ids;
  for (const auto& item : v->get_array()) {
    if (const boost::json::value* id = item.get_object().if_contains(key)) {
      ids.emplace_back(id->get_string());
    }
  }
  return ids;
}

// component.list / get / fingerprint, shared by the metamodel and the
// authentication metadata.
ApiInterfacePtr ComponentService(std::string_view prefix,
                                 std::shared_ptr<const SectionContainer> c) {
  auto check = [c](const std::string& id) {
    return id == c->Component() ? std::optional<MethodResult>()
                                : MethodResult::Error(Core::MetadataNotFoundError("component", id));
  };
  return Service(prefix, "component",
                 {BindQuery("list", {}, [c](const Args&) { return IdList({c->Component()}); }),
                  BindQuery("get", {{"componentId"}},
                            [c, check](const Args& a) {
                              if (auto e = check(*a[0])) return std::move(*e);
                              return MethodResult::Output(c->Section());
                            }),
                  BindQuery("fingerprint", {{"componentId"}}, [c, check](const Args& a) {
                    if (auto e = check(*a[0])) return std::move(*e);
                    return MethodResult::Output(boost::json::string(c->Fingerprint()));
                  })});
}

// service.operation.list / get over an index of services and one of
// operations keyed by full method name.
ApiInterfacePtr OperationService(std::string_view prefix, std::shared_ptr<const void> owner,
                                 const Index& services, const Index& operations) {
  return Service(
      prefix, "service.operation",
      {BindQuery("list", {{"serviceId"}},
                 [owner, &services](const Args& a) {
                   const boost::json::object* service = services.Find(*a[0]);
                   if (service == nullptr) {
                     return MethodResult::Error(Core::MetadataNotFoundError("service", *a[0]));
                   }
                   return IdList(MemberIds(*service, "operations", "id"));
                 }),
       BindQuery("get", {{"serviceId"}, {"operationId"}}, [owner, &operations](const Args& a) {
         return Entry(operations, "operation", *a[0] + "." + *a[1]);
       })});
}

// <name>.list / <name>.get(<idField>) over one index.
ApiInterfacePtr ListGetService(std::string_view prefix, std::string_view name,
                               std::shared_ptr<const void> owner, const Index& index,
                               const char* idField, std::string_view what) {
  return Service(
      prefix, name,
      {BindQuery("list", {}, [owner, &index](const Args&) { return IdList(index.Ids()); }),
       BindQuery("get", {{idField}},
                 [owner, &index, what](const Args& a) { return Entry(index, what, *a[0]); })});
}

// cli.command / cli.namespace: list([path]) / get(path, name) / fingerprint().
ApiInterfacePtr CliService(std::string_view name, std::shared_ptr<const Cli::MetadataContainer> c,
                           const Index& index, std::string_view what) {
  return Service(
      kCli, name,
      {BindQuery("list", {{"path", false}},
                 [c, &index](const Args& a) {
                   boost::json::array out;
                   for (const auto& key : index.Ids()) {
                     const boost::json::object& entry = *index.Find(key);
                     const boost::json::string& path = entry.at("path").get_string();
                     if (a[0] && path != *a[0]) continue;
                     out.push_back(boost::json::object{{"path", path}, {"name", entry.at("name")}});
                   }
                   return MethodResult::Output(std::move(out));
                 }),
       BindQuery("get", {{"path"}, {"name"}},
                 [c, &index, what](const Args& a) {
                   return Entry(index, what, Cli::MetadataContainer::Key(*a[0], *a[1]));
                 }),
       BindQuery("fingerprint", {}, [c](const Args&) {
         return MethodResult::Output(boost::json::string(c->Fingerprint()));
       })});
}

}  // namespace

std::vector<ApiInterfacePtr> CliInterfaces(std::shared_ptr<const Cli::MetadataContainer> c) {
  return {CliService("command", c, c->Commands(), "command"),
          CliService("namespace", c, c->Namespaces(), "namespace")};
}

std::vector<ApiInterfacePtr> MetamodelInterfaces(
    std::shared_ptr<const Metamodel::MetadataContainer> c) {
  auto resourceModels = Service(
      kMetamodel, "resource.model", {BindQuery("list", {{"resourceType"}}, [c](const Args& a) {
        const boost::json::object* resource = c->Resources().Find(*a[0]);
        if (resource == nullptr) {
          return MethodResult::Error(Core::MetadataNotFoundError("resource type", *a[0]));
        }
        const boost::json::value* models = resource->if_contains("models");
        return MethodResult::Output(models != nullptr ? *models : boost::json::array());
      })});
  auto hidden =
      Service(kMetamodel, "service.hidden",
              {BindQuery("list", {}, [c](const Args&) { return IdList(c->HiddenServices()); })});
  auto resources =
      Service(kMetamodel, "resource",
              {BindQuery("list", {}, [c](const Args&) { return IdList(c->Resources().Ids()); })});
  return {ComponentService(kMetamodel, c),
          ListGetService(kMetamodel, "enumeration", c, c->Enumerations(), "enumerationId",
                         "enumeration"),
          resourceModels,
          OperationService(kMetamodel, c, c->Services(), c->Operations()),
          hidden,
          ListGetService(kMetamodel, "package", c, c->Packages(), "packageId", "package"),
          resources,
          ListGetService(kMetamodel, "service", c, c->Services(), "serviceId", "service"),
          ListGetService(kMetamodel, "structure", c, c->Structures(), "structureId", "structure")};
}

std::vector<ApiInterfacePtr> AuthnInterfaces(
    std::shared_ptr<const Authentication::MetadataContainer> c) {
  return {ComponentService(kAuthn, c), OperationService(kAuthn, c, c->Services(), c->Operations()),
          ListGetService(kAuthn, "package", c, c->Packages(), "packageId", "package"),
          ListGetService(kAuthn, "service", c, c->Services(), "serviceId", "service")};
}

}  // namespace Lumo::Provider::Metadata
