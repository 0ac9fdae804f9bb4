#include "platform/ssl/firewall_utils.h"

#include <errno.h>
#include <string.h>

#include <fstream>
#include <mutex>
#include <set>

#include "platform/util/files.h"
#include "platform/util/log.h"
#include "platform/util/paths.h"

namespace Kestrel::Common::FirewallUtils {
namespace {

std::mutex gMutex;  // serialises the read-modify-replace of ruleset files

bool IsValidRulesetName(const std::string& ruleset) {
  return IsValidHostname(ruleset) && ruleset.find('/') == std::string::npos && ruleset != "." &&
         ruleset != "..";
}

std::string RulesetPath(const std::string& ruleset) {
  return Groundwork::RootPath(kRulesetDirectory) + "/" + ruleset;
}

bool ReadHosts(const std::string& path, std::set<std::string>& hosts) {
  std::ifstream in(path);
  if (!in) {
    if (errno != ENOENT) return false;
    hosts.clear();
    return true;
  }
  std::set<std::string> read;
  for (std::string line; std::getline(in, line);) {
    if (!line.empty()) read.insert(line);
  }
  if (in.bad()) return false;
  hosts = std::move(read);
  return true;
}

}  // namespace

bool IsValidHostname(std::string_view hostname) {
  if (hostname.empty()) return false;
  for (char c : hostname) {
    if (c <= ' ' || c > '~') return false;  // also every byte of 0x80 and above
  }
  return true;
}

bool AddOrRemoveServer(const std::string& ruleset, bool allow, const std::string& hostname) {
  if (!IsValidRulesetName(ruleset) || !IsValidHostname(hostname)) {
    Log_Level(2, "Firewall ruleset: refused an unusable ruleset or host name\n");
    return false;
  }
  std::lock_guard<std::mutex> lock(gMutex);
  const std::string path = RulesetPath(ruleset);
  std::set<std::string> hosts;
  if (!ReadHosts(path, hosts)) {
    Log_Level(2, "Firewall ruleset %s: cannot read %s: %s\n", ruleset.c_str(), path.c_str(),
              strerror(errno));
    return false;
  }
  const bool changed = allow ? hosts.insert(hostname).second : hosts.erase(hostname) > 0;
  if (!changed) return true;

  std::string text;
  for (const auto& host : hosts) text += host + "\n";
  std::string error;
  const std::string dir = path.substr(0, path.rfind('/'));
  if (!Groundwork::MakeDirectories(dir, 0755) ||
      !Groundwork::ReplaceFile(path, text, 0644, &error)) {
    if (error.empty()) error = "cannot create " + dir;
    Log_Level(2, "Firewall ruleset %s: %s\n", ruleset.c_str(), error.c_str());
    return false;
  }
  return true;
}

}  // namespace Kestrel::Common::FirewallUtils
