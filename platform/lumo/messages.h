// Localisable messages: an identifier, the default (English) text with its
// placeholders filled, and the named arguments. Services describe a message
// with a NamedMessageBuilder and turn builders into messages with a Localizer.
#pragma once

#include <string>
#include <utility>
#include <vector>

namespace Lumo {

struct MsgArgument {
  std::string name;
  std::string value;

  bool operator==(const MsgArgument&) const = default;
};

class NamedMessageBuilder {
 public:
  explicit NamedMessageBuilder(std::string id) : id_(std::move(id)) {}
  NamedMessageBuilder& Arg(std::string name, std::string value) {
    args_.push_back({std::move(name), std::move(value)});
    return *this;
  }
  NamedMessageBuilder& Arg(std::string name, long long value) {
    return Arg(std::move(name), std::to_string(value));
  }

  const std::string& Id() const { return id_; }
  const std::vector<MsgArgument>& Args() const { return args_; }

 private:
  std::string id_;
  std::vector<MsgArgument> args_;
};

namespace L10n {

struct LocalizableMessage {
  std::string id;
  std::string defaultMessage;
  std::vector<MsgArgument> args;  // in the order given

  bool operator==(const LocalizableMessage&) const = default;
};

// Replaces every "{name}" in `tmpl` with the value of the argument of that
// name. A placeholder without an argument, and a brace that does not open a
// well-formed placeholder, stay as written.
std::string FormatTemplate(const std::string& tmpl, const std::vector<MsgArgument>& args);

}  // namespace L10n
}  // namespace Lumo
