#include "platform/runtime/config.h"

#include <boost/algorithm/string/predicate.hpp>
#include <boost/property_tree/xml_parser.hpp>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <fstream>
#include <limits>
#include <sstream>
#include <stdexcept>
#include <string_view>
#include <utility>

namespace Strake::Service {
namespace {

using Path = boost::property_tree::ptree::path_type;

Path MakePath(std::string_view key) { return Path(std::string(key), '/'); }

void MergeInto(boost::property_tree::ptree& dst, const boost::property_tree::ptree& src,
               const std::string& prefix) {
  for (const auto& [name, child] : src) {
    if (name == "<xmlattr>" || name == "<xmlcomment>") continue;
    std::string key = prefix.empty() ? name : prefix + "/" + name;
    if (child.empty()) {
      dst.put(MakePath(key), child.data());
    } else {
      MergeInto(dst, child, key);
    }
  }
}

// Configuration documents are small and shallow; the XML reader recurses
// once per level, so deeper documents are refused before it sees them.
constexpr size_t kMaxNesting = 64;
constexpr size_t kMaxDocumentSize = 1 << 20;

// The end of the markup that starts at text[i] ('<'): one past its '>',
// quoted attribute values and comment, CDATA and declaration bodies
// skipped; text.size() when it does not end.
size_t EndOfMarkup(std::string_view text, size_t i) {
  for (auto [open, close] : {std::pair<std::string_view, std::string_view>{"<!--", "-->"},
                             {"<![CDATA[", "]]>"},
                             {"<?", "?>"}}) {
    if (text.substr(i).starts_with(open)) {
      size_t end = text.find(close, i + open.size());
      return end == std::string_view::npos ? text.size() : end + close.size();
    }
  }
  char quote = 0;
  for (size_t j = i + 1; j < text.size(); ++j) {
    if (quote != 0) {
      if (text[j] == quote) quote = 0;
    } else if (text[j] == '"' || text[j] == '\'') {
      quote = text[j];
    } else if (text[j] == '>') {
      return j + 1;
    }
  }
  return text.size();
}

// Throws when elements nest deeper than kMaxNesting.
void CheckNesting(std::string_view text, const std::string& what) {
  size_t depth = 0;
  for (size_t i = text.find('<'); i != std::string_view::npos; i = text.find('<', i)) {
    const size_t end = EndOfMarkup(text, i);
    const std::string_view tag = text.substr(i, end - i);
    if (tag.starts_with("</")) {
      if (depth > 0) --depth;
    } else if (!tag.starts_with("<!") && !tag.starts_with("<?") && !tag.ends_with("/>") &&
               ++depth > kMaxNesting) {
      throw std::runtime_error(what + ": elements nest deeper than " + std::to_string(kMaxNesting) +
                               " levels");
    }
    i = end;
  }
}

boost::property_tree::ptree ParseConfigRoot(std::istream& stream, const std::string& what) {
  std::string text(kMaxDocumentSize + 1, '\0');
  stream.read(text.data(), static_cast<std::streamsize>(text.size()));
  text.resize(static_cast<size_t>(stream.gcount()));
  if (text.size() > kMaxDocumentSize) {
    throw std::runtime_error(what + ": larger than " + std::to_string(kMaxDocumentSize) + " bytes");
  }
  CheckNesting(text, what);
  std::istringstream in(text);
  boost::property_tree::ptree doc;
  try {
    boost::property_tree::read_xml(in, doc,
                                   boost::property_tree::xml_parser::trim_whitespace |
                                       boost::property_tree::xml_parser::no_comments);
  } catch (const boost::property_tree::xml_parser_error& e) {
    throw std::runtime_error(what + ": " + e.message() + " (line " + std::to_string(e.line()) +
                             ")");
  }
  auto root = doc.get_child_optional("config");
  if (!root || doc.size() != 1) {
    throw std::runtime_error(what + ": the root element is not <config>");
  }
  return *root;
}

}  // namespace

void Config::SetString(std::string_view key, std::string value) {
  tree_.put(MakePath(key), std::move(value));
}

void Config::SetBool(std::string_view key, bool value) {
  SetString(key, value ? "true" : "false");
}

void Config::SetInt(std::string_view key, int64_t value) {
  SetString(key, std::to_string(value));
}

bool Config::Has(std::string_view key) const {
  return static_cast<bool>(tree_.get_child_optional(MakePath(key)));
}

std::optional<std::string> Config::GetString(std::string_view key) const {
  auto child = tree_.get_child_optional(MakePath(key));
  if (!child) return std::nullopt;
  return child->data();
}

std::string Config::GetString(std::string_view key, std::string fallback) const {
  auto value = GetString(key);
  return value ? *value : std::move(fallback);
}

bool Config::GetBool(std::string_view key, bool fallback) const {
  auto value = GetString(key);
  if (!value) return fallback;
  if (boost::iequals(*value, "true") || *value == "1") return true;
  if (boost::iequals(*value, "false") || *value == "0") return false;
  return fallback;
}

int64_t Config::GetInt(std::string_view key, int64_t fallback) const {
  auto value = GetString(key);
  if (!value || value->empty()) return fallback;
  int64_t n = 0;
  const char* begin = value->data();
  const char* end = begin + value->size();
  if (*begin == '+') ++begin;
  auto [ptr, ec] = std::from_chars(begin, end, n);
  if (ec == std::errc::result_out_of_range && ptr == end) {
    // A number beyond the 64-bit range counts as the nearest one within it,
    // so a setting's clamp still applies.
    return *value->data() == '-' ? std::numeric_limits<int64_t>::min()
                                 : std::numeric_limits<int64_t>::max();
  }
  if (ec != std::errc() || ptr != end) return fallback;
  return n;
}

void Config::Merge(const boost::property_tree::ptree& root) {
  boost::property_tree::ptree merged = tree_;
  MergeInto(merged, root, "");
  tree_.swap(merged);
}

void Config::MergeXmlFile(const std::string& path) {
  std::ifstream in(path);
  if (!in) {
    throw std::runtime_error("cannot read " + path + ": " + std::strerror(errno));
  }
  Merge(ParseConfigRoot(in, path));
}

void Config::MergeXmlText(const std::string& text) {
  std::istringstream in(text);
  Merge(ParseConfigRoot(in, "configuration text"));
}

std::shared_ptr<Config> CreateScratchConfig() { return std::make_shared<Config>(); }

}  // namespace Strake::Service
