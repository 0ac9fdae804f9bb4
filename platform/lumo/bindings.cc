#include "platform/lumo/bindings.h"

#include <algorithm>

#include "platform/util/base64.h"

namespace Lumo::Bindings {

DecodeError::DecodeError(std::string path, std::string problem)
    : std::runtime_error(path.empty() ? problem : path + ": " + problem),
      path_(std::move(path)),
      problem_(std::move(problem)) {}

DecodeError DecodeError::Within(std::string_view parent) const {
  std::string path(parent);
  if (!path_.empty()) path += "." + path_;
  return DecodeError(std::move(path), problem_);
}

std::string Describe(const DecodeError& error) {
  if (error.Path().empty()) return error.Problem();
  return "field '" + error.Path() + "': " + error.Problem();
}

namespace {

const boost::json::object& AsObject(const boost::json::value& value) {
  if (!value.is_object()) throw DecodeError("", "expected an object");
  return value.get_object();
}

}  // namespace

ObjectReader::ObjectReader(const boost::json::value& value) : object_(AsObject(value)) {}

const boost::json::value* ObjectReader::Optional(std::string_view name) {
  read_.push_back(name);
  const boost::json::value* v = object_.if_contains(name);
  if (v == nullptr || v->is_null()) return nullptr;
  return v;
}

const boost::json::value& ObjectReader::Required(std::string_view name) {
  const boost::json::value* v = Optional(name);
  if (v == nullptr) throw DecodeError(std::string(name), "missing");
  return *v;
}

const boost::json::string& ObjectReader::RequiredString(std::string_view name) {
  const boost::json::value& v = Required(name);
  if (!v.is_string()) throw DecodeError(std::string(name), "expected a string");
  return v.get_string();
}

std::string ObjectReader::String(std::string_view name) {
  const boost::json::string& s = RequiredString(name);
  return std::string(s.data(), s.size());
}

std::optional<std::string> ObjectReader::OptionalString(std::string_view name) {
  if (!object_.contains(name) || object_.at(name).is_null()) {
    read_.push_back(name);
    return std::nullopt;
  }
  return String(name);
}

Groundwork::SecureString ObjectReader::Secret(std::string_view name) {
  const boost::json::string& s = RequiredString(name);
  return Groundwork::SecureString(std::string_view(s.data(), s.size()));
}

std::optional<Groundwork::SecureString> ObjectReader::OptionalSecret(std::string_view name) {
  if (!object_.contains(name) || object_.at(name).is_null()) {
    read_.push_back(name);
    return std::nullopt;
  }
  return Secret(name);
}

int64_t ObjectReader::Int64(std::string_view name) {
  const boost::json::value& v = Required(name);
  if (v.is_int64()) return v.get_int64();
  if (v.is_uint64()) throw DecodeError(std::string(name), "integer out of range");
  throw DecodeError(std::string(name), "expected an integer");
}

std::optional<int64_t> ObjectReader::OptionalInt64(std::string_view name) {
  if (Optional(name) == nullptr) return std::nullopt;
  return Int64(name);
}

bool ObjectReader::Bool(std::string_view name) {
  const boost::json::value& v = Required(name);
  if (!v.is_bool()) throw DecodeError(std::string(name), "expected true or false");
  return v.get_bool();
}

std::optional<bool> ObjectReader::OptionalBool(std::string_view name) {
  if (Optional(name) == nullptr) return std::nullopt;
  return Bool(name);
}

std::vector<std::string> ObjectReader::StringList(std::string_view name) {
  const boost::json::value& v = Required(name);
  if (!v.is_array()) throw DecodeError(std::string(name), "expected a list");
  std::vector<std::string> out;
  out.reserve(v.get_array().size());
  for (const auto& item : v.get_array()) {
    if (!item.is_string()) throw DecodeError(std::string(name), "expected a list of strings");
    out.emplace_back(item.get_string().data(), item.get_string().size());
  }
  return out;
}

std::optional<std::vector<std::string>> ObjectReader::OptionalStringList(std::string_view name) {
  if (Optional(name) == nullptr) return std::nullopt;
  return StringList(name);
}

Groundwork::SecureBytes ObjectReader::Binary(std::string_view name) {
  const boost::json::string& s = RequiredString(name);
  Groundwork::SecureBytes bytes;
  if (!Base64_Decode(std::string_view(s.data(), s.size()), &bytes)) {
    throw DecodeError(std::string(name), "expected Base64 text");
  }
  return bytes;
}

void ObjectReader::Finish() const {
  for (const auto& field : object_) {
    std::string_view key = field.key();
    if (std::find(read_.begin(), read_.end(), key) == read_.end()) {
      throw DecodeError(std::string(key), "unknown field");
    }
  }
}

NoInput tag_invoke(boost::json::value_to_tag<NoInput>, const boost::json::value& value) {
  ObjectReader(value).Finish();
  return {};
}

}  // namespace Lumo::Bindings

namespace Lumo::Provider {

BoundOperation BindQuery(std::string id, std::vector<QueryField> fields, QueryFn fn) {
  return {std::move(id), [fields = std::move(fields), fn = std::move(fn)](
                             const Core::CallPtr& call, Core::Completion completion) {
            std::vector<std::optional<std::string>> args;
            args.reserve(fields.size());
            try {
              Bindings::ObjectReader reader(call->input);
              for (const auto& f : fields) {
                args.push_back(f.required ? std::optional<std::string>(reader.String(f.name))
                                          : reader.OptionalString(f.name));
              }
              reader.Finish();
            } catch (const Bindings::DecodeError& e) {
              completion.Complete(Core::MethodResult::InvalidParams(Bindings::Describe(e)));
              return;
            }
            completion.Complete(fn(args));
          }};
}

}  // namespace Lumo::Provider
