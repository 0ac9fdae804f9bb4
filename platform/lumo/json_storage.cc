#include "platform/lumo/json_storage.h"

#include <boost/json/array.hpp>
#include <boost/json/object.hpp>

namespace Lumo::Data {

boost::json::array MessagesToJson(const std::vector<L10n::LocalizableMessage>& messages) {
  boost::json::array out;
  out.reserve(messages.size());
  for (const auto& m : messages) {
    boost::json::object args;
    for (const auto& a : m.args) args[a.name] = a.value;
    out.push_back(boost::json::object{
        {"id", m.id}, {"defaultMessage", m.defaultMessage}, {"args", std::move(args)}});
  }
  return out;
}

}  // namespace Lumo::Data
