// The runtime's configuration tree.
//
// Keys are slash-separated paths ("log/level"). Values are kept as text and
// converted on read. In the XML file each path segment is a nested element
// under a <config> root:
//
//   <config><log><level>info</level></log><caching>true</caching></config>
//
// A Config is filled on the main thread at start-up and only read afterwards;
// concurrent reads are safe, writes are not.
#pragma once

#include <boost/property_tree/ptree.hpp>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace Strake::Service {

class Config {
 public:
  void SetString(std::string_view key, std::string value);
  void SetBool(std::string_view key, bool value);
  void SetInt(std::string_view key, int64_t value);

  bool Has(std::string_view key) const;
  std::optional<std::string> GetString(std::string_view key) const;
  std::string GetString(std::string_view key, std::string fallback) const;
  // "true"/"false"/"1"/"0" (any letter case); `fallback` when absent or not
  // a boolean.
  bool GetBool(std::string_view key, bool fallback) const;
  // A decimal number that fits 64 bits; `fallback` when absent or not one.
  int64_t GetInt(std::string_view key, int64_t fallback) const;

  // Loads an XML file over the current values: every element of the file
  // replaces or adds the value at its path; keys the file omits keep theirs.
  // Throws std::runtime_error when the file cannot be read or parsed, or its
  // root element is not <config>; the tree is unchanged then.
  void MergeXmlFile(const std::string& path);
  void MergeXmlText(const std::string& text);

 private:
  void Merge(const boost::property_tree::ptree& root);
  boost::property_tree::ptree tree_;
};

// Creates an empty configuration for start-up to write its defaults into.
std::shared_ptr<Config> CreateScratchConfig();

}  // namespace Strake::Service
