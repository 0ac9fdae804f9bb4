// Decoding a call's named inputs into typed request records, and binding
// operation ids to the functions that serve them.
//
// Request records decode through Boost.JSON (`tag_invoke` for `value_to`)
// written with ObjectReader, which reports a missing field, a field of the
// wrong type and a field the operation does not know as a DecodeError naming
// the field. The binder turns a DecodeError into an "invalid params" result;
// nothing a caller sends can make decoding crash.
#pragma once

#include <boost/json/value.hpp>
#include <boost/json/value_to.hpp>
#include <boost/system/system_error.hpp>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "platform/lumo/async_result.h"
#include "platform/lumo/call.h"
#include "platform/util/secure_buffer.h"

namespace Lumo::Bindings {

class DecodeError : public std::runtime_error {
 public:
  // `path` names the field ("spec.keyServer.type"; empty for the inputs as a
  // whole), `problem` what is wrong with it.
  DecodeError(std::string path, std::string problem);

  const std::string& Path() const { return path_; }
  const std::string& Problem() const { return problem_; }
  // The same error one level further out: "spec" + ".keyServer.type".
  DecodeError Within(std::string_view parent) const;

 private:
  std::string path_;
  std::string problem_;
};

// Reads the fields of one JSON object. Optional fields may be absent or null.
// Finish() rejects any field that was not read.
class ObjectReader {
 public:
  // Throws DecodeError when `value` is not an object.
  explicit ObjectReader(const boost::json::value& value);

  std::string String(std::string_view name);
  std::optional<std::string> OptionalString(std::string_view name);
  // A string that is a secret (credential, key, private key).
  Groundwork::SecureString Secret(std::string_view name);
  std::optional<Groundwork::SecureString> OptionalSecret(std::string_view name);
  int64_t Int64(std::string_view name);
  std::optional<int64_t> OptionalInt64(std::string_view name);
  bool Bool(std::string_view name);
  std::optional<bool> OptionalBool(std::string_view name);
  std::vector<std::string> StringList(std::string_view name);
  std::optional<std::vector<std::string>> OptionalStringList(std::string_view name);
  // A byte sequence sent as standard Base64 text; other text is refused.
  Groundwork::SecureBytes Binary(std::string_view name);

  // A nested record, decoded with its own value_to conversion.
  template <typename T>
  T Struct(std::string_view name) {
    return DecodeNested<T>(name, Required(name));
  }
  template <typename T>
  std::optional<T> OptionalStruct(std::string_view name) {
    const boost::json::value* v = Optional(name);
    if (v == nullptr) return std::nullopt;
    return DecodeNested<T>(name, *v);
  }
  template <typename T>
  std::vector<T> List(std::string_view name) {
    return DecodeList<T>(name, Required(name));
  }
  template <typename T>
  std::optional<std::vector<T>> OptionalList(std::string_view name) {
    const boost::json::value* v = Optional(name);
    if (v == nullptr) return std::nullopt;
    return DecodeList<T>(name, *v);
  }

  void Finish() const;

 private:
  const boost::json::value& Required(std::string_view name);
  const boost::json::value* Optional(std::string_view name);
  const boost::json::string& RequiredString(std::string_view name);

  template <typename T>
  static std::vector<T> DecodeList(std::string_view name, const boost::json::value& v) {
    if (!v.is_array()) throw DecodeError(std::string(name), "expected a list");
    std::vector<T> out;
    out.reserve(v.get_array().size());
    for (const auto& item : v.get_array()) out.push_back(DecodeNested<T>(name, item));
    return out;
  }
  template <typename T>
  static T DecodeNested(std::string_view name, const boost::json::value& v) {
    try {
      return boost::json::value_to<T>(v);
    } catch (const DecodeError& e) {
      throw e.Within(name);
    }
  }

  const boost::json::object& object_;
  std::vector<std::string_view> read_;
};

// "field 'spec.provider': expected a string", or the problem alone when the
// error is about the inputs as a whole.
std::string Describe(const DecodeError& error);

// Inputs of an operation that takes none: any field is refused.
struct NoInput {};
NoInput tag_invoke(boost::json::value_to_tag<NoInput>, const boost::json::value& value);

}  // namespace Lumo::Bindings

namespace Lumo::Provider {

using OperationInvoker = std::function<void(const Core::CallPtr& call, Core::Completion)>;

struct BoundOperation {
  std::string id;  // operation id, e.g. "generate_key"
  OperationInvoker invoke;
};

// One bound service: its id and its operations.
struct ApiInterface {
  std::string serviceId;
  std::vector<BoundOperation> operations;
};

using ApiInterfacePtr = std::shared_ptr<const ApiInterface>;

// Binds operation `id` to `fn(Input, AsyncResult<Output>, const AsyncActivation&)`:
// decodes the call's inputs into Input and answers "invalid params" when they
// do not decode, without calling `fn`.
template <typename Input, typename Output, typename Fn>
BoundOperation BindOperation(std::string id, Fn fn) {
  return {std::move(id),
          [fn = std::move(fn)](const Core::CallPtr& call, Core::Completion completion) {
            std::optional<Input> input;
            try {
              input.emplace(boost::json::value_to<Input>(call->input));
            } catch (const Bindings::DecodeError& e) {
              completion.Complete(Core::MethodResult::InvalidParams(Bindings::Describe(e)));
              return;
            } catch (const boost::system::system_error& e) {
              completion.Complete(Core::MethodResult::InvalidParams(e.what()));
              return;
            }
            fn(std::move(*input), AsyncResult<Output>(std::move(completion)), call->activation);
          }};
}

// Operations whose inputs are a few named strings and whose answer is
// computed at once (introspection and metadata queries).
struct QueryField {
  const char* name;
  bool required = true;
};
// Receives the fields in the order declared; an absent optional field is
// nullopt.
using QueryFn = std::function<Core::MethodResult(const std::vector<std::optional<std::string>>&)>;
BoundOperation BindQuery(std::string id, std::vector<QueryField> fields, QueryFn fn);

}  // namespace Lumo::Provider
