#include "platform/lumo/metadata.h"

#include <gtest/gtest.h>

#include <boost/json/parse.hpp>
#include <boost/json/serialize.hpp>
#include <cstring>
#include <fstream>
#include <sstream>

#include "platform/lumo/authz.h"
#include "tests/support/temp_dir.h"

namespace {

namespace M = Lumo::Provider::Metadata;
using Lumo::Core::MethodResult;

constexpr const char* kGood = R"({
  "cli": {"component": "c", "namespaces": [{"path": "", "name": "kms"}],
          "commands": [{"path": "kms", "name": "get", "service": "s.svc", "operation": "get"}]},
  "metamodel": {"component": "m", "packages": [{"id": "s",
      "structures": [{"id": "s.info", "fields": [{"name": "n", "type": {"optional": "string"}},
                                                  {"name": "h", "type": {"enumeration": "s.h"}}]}],
      "enumerations": [{"id": "s.h", "values": []}],
      "services": [{"id": "s.svc", "operations": [
        {"id": "get", "params": [{"name": "p", "type": "string"}], "output": {"structure": "s.info"}}]}]}]},
  "authentication": {"component": "a", "packages": [{"id": "s", "services": [
      {"id": "s.svc", "operations": [{"id": "get", "schemes": ["oauth"]}]}]}]},
  "authorization": {"rules": [{"entitlements": ["@E"], "operations": ["s.svc.get"]}]}
})";

class MetadataTest : public ::testing::Test {
 protected:
  std::string Write(const std::string& text) {
    std::string path = tmp_ / "meta.json";
    std::ofstream(path) << text;
    return path;
  }
  // The reason a metamodel section fails to load, or "" when it loads.
  std::string MetamodelProblem(const std::string& text) {
    M::Metamodel::MetadataContainer c;
    auto error = M::ProviderHelper::LoadMetamodelMetadataFile(Write(text), "m", c);
    return error ? error->Messages().at(0).defaultMessage : "";
  }

  ZyrdTest::TempDir tmp_;
  const std::string& dir_ = tmp_.Path();
};

TEST_F(MetadataTest, LoadFailuresSayWhat) {
  M::Cli::MetadataContainer cli;
  auto error = M::ProviderHelper::LoadCliMetadataFile(dir_ + "/absent.json", "c", cli);
  ASSERT_NE(error, nullptr);
  EXPECT_EQ(error->Messages().at(0).defaultMessage,
            "Unable to load metadata from " + dir_ + "/absent.json: cannot open the file");
  EXPECT_NE(M::ProviderHelper::LoadCliMetadataFile(Write(kGood), "other", cli), nullptr);

  EXPECT_EQ(MetamodelProblem(kGood), "");
  EXPECT_EQ(MetamodelProblem("{"), "Unable to load metadata from " + dir_ +
                                       "/meta.json: not valid JSON (incomplete JSON)");
  const std::tuple<const char*, const char*, const char*> edits[] = {
      {R"({"enumeration": "s.h"})", R"({"enumeration": "s.x"})", "unknown enumeration 's.x'"},
      {R"("type": "string")", R"("type": "text")", "unknown type 'text'"},
      {R"({"id": "get", "params")", R"({"id": "get", "output": "void"}, {"id": "get", "params")",
       "duplicate operation 's.svc.get'"},
  };
  for (auto [from, to, problem] : edits) {
    std::string text = kGood;
    text.replace(text.find(from), strlen(from), to);
    EXPECT_NE(MetamodelProblem(text).find(problem), std::string::npos) << problem;
  }
}

TEST_F(MetadataTest, AuthorizationRulesAreCheckedWhenLoaded) {
  auto load = [&](const char* section) {
    Lumo::Authz::AuthzInfo info;
    std::istringstream in(std::string(R"({"authorization":)") + section + "}");
    std::vector<std::string> messages;
    bool ok = Lumo::Authz::Metadata::LoadAuthzInfoMetadata::Load(in, info, nullptr, messages);
    return ok ? std::string("ok") : messages.at(0);
  };
  EXPECT_EQ(load(R"({"rules":[]})"), "ok");
  EXPECT_EQ(load(R"({"rules":[{"entitlements":["@E"],"operations":["a.b","a.b"]}]})"),
            "a second rule for a.b");
  EXPECT_EQ(load(R"({"rules":[{"entitlements":[],"operations":["a.b"]}]})"),
            "each rule needs a non-empty \"entitlements\" list and an \"operations\" list");
  EXPECT_EQ(load(R"({"rules":[{"entitlements":["@E"],"operations":["nodot"]}]})"),
            "operations must be full method names");
  EXPECT_EQ(
      load(
          R"({"rules":[{"entitlements":["@E"],"operations":["com.tarsel.lumo.std.introspection.provider.get"]}]})"),
      "a second rule for com.tarsel.lumo.std.introspection.provider.get");
}

TEST_F(MetadataTest, MetadataServicesAnswerFromTheContainers) {
  auto mm = std::make_shared<M::Metamodel::MetadataContainer>();
  ASSERT_EQ(M::ProviderHelper::LoadMetamodelMetadataFile(Write(kGood), "m", *mm), nullptr);
  std::map<std::string, Lumo::Provider::OperationInvoker> ops;
  for (const auto& iface : M::MetamodelInterfaces(mm)) {
    for (const auto& op : iface->operations) ops[iface->serviceId + "." + op.id] = op.invoke;
  }
  EXPECT_EQ(ops.size(), 16u);
  const std::string p = "com.tarsel.lumo.metadata.metamodel.";
  const std::pair<std::string, const char*> asks[] = {
      {"service.operation.list", R"({"serviceId":"s.svc"})"},
      {"service.operation.get", R"({"serviceId":"s.svc","operationId":"nope"})"},
      {"structure.get", "{}"},
      {"component.fingerprint", R"({"componentId":"m"})"}};
  std::vector<std::string> answers;
  for (const auto& [method, input] : asks) {
    auto call = std::make_shared<Lumo::Core::Call>(p + method, boost::json::parse(input));
    ops.at(p + method)(call, Lumo::Core::Completion(call, [&](MethodResult r) {
                         answers.push_back(r.IsOutput() ? boost::json::serialize(r.output)
                                           : r.error    ? r.error->Messages().at(0).defaultMessage
                                                        : "invalid: " + r.detail);
                       }));
  }
  EXPECT_EQ(answers,
            (std::vector<std::string>{R"(["get"])", "The operation 's.svc.nope' does not exist.",
                                      "invalid: field 'structureId': missing",
                                      "\"" + mm->Fingerprint() + "\""}));
}

}  // namespace
