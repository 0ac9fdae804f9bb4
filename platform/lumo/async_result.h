// Results of API calls.
//
// Completion is the untyped end of a call: whoever holds it must complete it
// exactly once. Completing it a second time is a programming error that stops
// the process. When the last copy of a Completion goes away without it having
// been completed, the call is completed with the standard error
// "com.tarsel.lumo.std.errors.internal_server_error" and the omission is
// logged, so the caller always gets an answer and a connection never hangs.
//
// AsyncResult<T> is the typed face that service operations receive: it turns
// the operation's result record into JSON (through the record's Boost.JSON
// conversion) and completes the underlying Completion.
//
// Copies of a Completion or AsyncResult share one state; they may be handed
// to other threads. The state is thread-safe.
#pragma once

#include <atomic>
#include <boost/json/value.hpp>
#include <boost/json/value_from.hpp>
#include <functional>
#include <memory>
#include <string>

#include "platform/lumo/call.h"
#include "platform/lumo/errors.h"
#include "platform/lumo/json_storage.h"

namespace Lumo::Core {

struct MethodResult {
  enum class Kind {
    kOutput,         // `output` holds the operation's result (null for none)
    kError,          // `error` holds the error value
    kInvalidParams,  // the inputs did not decode; `detail` says why
  };

  Kind kind = Kind::kOutput;
  boost::json::value output;
  Data::ErrorValuePtr error;
  std::string detail;

  static MethodResult Output(boost::json::value value) {
    return {Kind::kOutput, std::move(value), nullptr, {}};
  }
  static MethodResult Error(Data::ErrorValuePtr error) {
    return {Kind::kError, nullptr, std::move(error), {}};
  }
  static MethodResult InvalidParams(std::string detail) {
    return {Kind::kInvalidParams, nullptr, nullptr, std::move(detail)};
  }
  bool IsOutput() const { return kind == Kind::kOutput; }
};

using MethodResultCallback = std::function<void(MethodResult)>;

class Completion {
 public:
  // `call` names the call in the log line written when the completion is
  // dropped; it may be null.
  Completion(CallPtr call, MethodResultCallback done);

  // Completes the call. A second completion of the same state stops the
  // process.
  void Complete(MethodResult result) const;

  // Whether some copy has completed the call.
  bool Completed() const;

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace Lumo::Core

namespace Lumo {

template <typename T>
class AsyncResult {
 public:
  explicit AsyncResult(Core::Completion completion) : completion_(std::move(completion)) {}

  void SetResult(const T& value) const {
    completion_.Complete(Core::MethodResult::Output(
        boost::json::value_from(value, Groundwork::WipingJsonStorage())));
  }
  void SetError(Data::ErrorValuePtr error) const {
    completion_.Complete(Core::MethodResult::Error(std::move(error)));
  }
  bool Completed() const { return completion_.Completed(); }

 private:
  Core::Completion completion_;
};

// Operations without a result complete with SetResult().
template <>
class AsyncResult<void> {
 public:
  explicit AsyncResult(Core::Completion completion) : completion_(std::move(completion)) {}

  void SetResult() const { completion_.Complete(Core::MethodResult::Output(nullptr)); }
  void SetError(Data::ErrorValuePtr error) const {
    completion_.Complete(Core::MethodResult::Error(std::move(error)));
  }
  bool Completed() const { return completion_.Completed(); }

 private:
  Core::Completion completion_;
};

}  // namespace Lumo
