#include "platform/kmip/session_description.h"

#include <charconv>
#include <set>
#include <type_traits>

#include "platform/kmip/item_list.h"
#include "platform/util/hex.h"

namespace Qlc {
namespace {

using Items = std::vector<TextItem>;

class DescriptionReader {
 public:
  explicit DescriptionReader(std::string* error) : error_(error) {}

  bool Fail(const std::string& what) {
    *error_ = "invalid session description: " + what;
    return false;
  }

  // Checks that `items` has only names from `allowed`, each at most once.
  bool CheckNames(const Items& items, std::initializer_list<std::string_view> allowed,
                  std::string_view where) {
    std::set<std::string_view> seen;
    for (const TextItem& item : items) {
      bool known = false;
      for (std::string_view a : allowed) known = known || item.name == a;
      if (!known) return Fail("unknown item '" + item.name + "' in " + std::string(where));
      if (item.name != "Trusted_Cert" && !seen.insert(item.name).second) {
        return Fail("item '" + item.name + "' given twice in " + std::string(where));
      }
    }
    return true;
  }

  static const TextItem* Get(const Items& items, std::string_view name) {
    for (const TextItem& item : items) {
      if (item.name == name) return &item;
    }
    return nullptr;
  }

  bool Text(const Items& items, std::string_view name, std::string_view where,
            const TextItem** out) {
    const TextItem* item = Get(items, name);
    if (item == nullptr)
      return Fail("missing item '" + std::string(name) + "' in " + std::string(where));
    if (!item->hasValue || item->isList) {
      return Fail("item '" + std::string(name) + "' in " + std::string(where) +
                  " needs a text value");
    }
    *out = item;
    return true;
  }

  bool Keyword(const Items& items, std::string_view name, std::string_view expected,
               std::string_view where) {
    const TextItem* item = nullptr;
    if (!Text(items, name, where, &item)) return false;
    if (item->text.view() != expected) {
      return Fail(std::string(where) + " " + std::string(name) + " must be " +
                  std::string(expected));
    }
    return true;
  }

  bool Flag(const Items& items, std::string_view name) {
    const TextItem* item = Get(items, name);
    if (item == nullptr) return Fail("missing item '" + std::string(name) + "' in Session");
    if (item->hasValue) return Fail("item '" + std::string(name) + "' takes no value");
    return true;
  }

  // A decimal number of at least `min`; above `max` it fails, or counts as
  // `max` when `clamp` is set.
  static bool Number(std::string_view text, long long min, long long max, bool clamp,
                     long long* out) {
    if (text.empty() || text.size() > 18) return false;
    long long v = 0;
    auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), v);
    if (ec != std::errc() || end != text.data() + text.size() || v < min) return false;
    if (v > max && !clamp) return false;
    *out = v > max ? max : v;
    return true;
  }

  bool EndpointOf(const Items& items, std::string_view where, Endpoint* out) {
    const TextItem* host = nullptr;
    const TextItem* port = nullptr;
    if (!Text(items, "Host", where, &host) || !Text(items, "Port", where, &port)) return false;
    std::string_view h = host->text.view();
    if (h.size() >= 2 && h.front() == '[' && h.back() == ']') h = h.substr(1, h.size() - 2);
    if (h.empty() || h.size() > 253) return Fail(std::string(where) + " Host is empty or too long");
    for (char c : h) {
      if (static_cast<unsigned char>(c) <= ' ' || c == 0x7f || c == '[' || c == ']' || c == '/') {
        return Fail(std::string(where) + " Host has a character not allowed in a host name");
      }
    }
    long long p = 0;
    if (!Number(port->text.view(), 1, 65535, false, &p)) {
      return Fail(std::string(where) + " Port must be a number from 1 to 65535");
    }
    out->host.assign(h);
    out->port = static_cast<uint16_t>(p);
    return true;
  }

  // "PEM:[hex]" into `out` (which may be a wiping string).
  template <typename S>
  bool Pem(const TextItem& item, S* out) {
    std::string_view v = item.text.view();
    constexpr std::string_view kPrefix = "PEM:[";
    if (!item.hasValue || item.isList || v.size() < kPrefix.size() + 1 ||
        v.substr(0, kPrefix.size()) != kPrefix || v.back() != ']') {
      return Fail("item '" + item.name + "' must be PEM:[hex]");
    }
    std::string_view hex = v.substr(kPrefix.size(), v.size() - kPrefix.size() - 1);
    if (hex.empty() || hex.size() % 2 != 0) {
      return Fail("item '" + item.name + "' has an empty or odd-length hex text");
    }
    out->clear();
    for (size_t i = 0; i < hex.size(); i += 2) {
      int hi = HexDigit(hex[i]);
      int lo = HexDigit(hex[i + 1]);
      if (hi < 0 || lo < 0) {
        return Fail("item '" + item.name + "' has a character that is not a hex digit");
      }
      char c = static_cast<char>(hi << 4 | lo);
      if constexpr (std::is_same_v<S, std::string>) {
        out->push_back(c);
      } else {
        out->str().push_back(c);
      }
    }
    return true;
  }

  static int HexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
  }

  bool Session(const Items& items, SessionConfig* out) {
    if (!CheckNames(items,
                    {"Proxy", "Protocol", "Host", "Port", "Timeout", "Certificate", "Public",
                     "Private", "User_Trust", "Authenticate"},
                    "Session")) {
      return false;
    }
    if (const TextItem* proxy = Get(items, "Proxy")) {
      if (!proxy->isList) return Fail("Proxy must be a list");
      if (!CheckNames(proxy->list, {"Protocol", "Host", "Port"}, "Proxy") ||
          !Keyword(proxy->list, "Protocol", "HTTP", "Proxy")) {
        return false;
      }
      out->proxy.emplace();
      if (!EndpointOf(proxy->list, "Proxy", &*out->proxy)) return false;
    }
    if (!Keyword(items, "Protocol", "SSL", "Session") ||
        !EndpointOf(items, "Session", &out->server)) {
      return false;
    }
    const TextItem* timeout = nullptr;
    if (!Text(items, "Timeout", "Session", &timeout)) return false;
    std::string_view t = timeout->text.view();
    constexpr std::string_view kUnit = ":Seconds";
    long long seconds = 0;
    if (t.size() <= kUnit.size() || t.substr(t.size() - kUnit.size()) != kUnit ||
        !Number(t.substr(0, t.size() - kUnit.size()), 1, kMaxTimeoutSeconds, true, &seconds)) {
      return Fail("Timeout must be a whole number of seconds of at least 1, as N:Seconds");
    }
    out->timeoutSeconds = static_cast<int>(seconds);

    const TextItem* cert = Get(items, "Certificate");
    const TextItem* pub = Get(items, "Public");
    const TextItem* priv = Get(items, "Private");
    if (cert || pub || priv) {
      if (!cert || !pub || !priv) return Fail("Certificate, Public and Private go together");
      std::string public_text;
      if (!Pem(*cert, &out->clientCertificate) || !Pem(*pub, &public_text) ||
          !Pem(*priv, &out->clientPrivateKey)) {
        return false;
      }
    }
    return Flag(items, "User_Trust") && Flag(items, "Authenticate");
  }

  bool Top(const Items& items, SessionConfig* out) {
    if (!CheckNames(items, {"Presentation", "Session", "Trusted_Cert"}, "the description")) {
      return false;
    }
    const TextItem* presentation = Get(items, "Presentation");
    const TextItem* session = Get(items, "Session");
    if (presentation == nullptr || !presentation->isList) return Fail("missing Presentation={...}");
    if (session == nullptr || !session->isList) return Fail("missing Session={...}");
    const Items& p = presentation->list;
    if (!CheckNames(p, {"Protocol", "Version", "Format"}, "Presentation") ||
        !Keyword(p, "Protocol", "KMIP", "Presentation") ||
        !Keyword(p, "Version", "1.1", "Presentation") ||
        !Keyword(p, "Format", "TTLV", "Presentation")) {
      return false;
    }
    if (!Session(session->list, out)) return false;
    for (const TextItem& item : items) {
      if (item.name != "Trusted_Cert") continue;
      out->trustedCertificates.emplace_back();
      if (!Pem(item, &out->trustedCertificates.back())) return false;
    }
    return true;
  }

 private:
  std::string* error_;
};

}  // namespace

bool ParseSessionDescription(std::string_view text, SessionConfig* out, std::string* error) {
  *out = SessionConfig();
  std::vector<TextItem> items;
  if (!ParseItemList(text, nullptr, &items, error)) {
    *error = "invalid session description: " + *error;
    return false;
  }
  DescriptionReader reader(error);
  return reader.Top(items, out);
}

Groundwork::SecureString FormatSessionDescription(const SessionConfig& c) {
  Groundwork::SecureString out;
  auto& s = out.str();
  s += "Presentation={Protocol=KMIP, Version='1.1', Format=TTLV}, Session = {";
  if (c.proxy) {
    s += "Proxy={Protocol=HTTP, Host='" + c.proxy->host + "', Port='" +
         std::to_string(c.proxy->port) + "'},";
  }
  s += "Protocol=SSL, Host='" + c.server.host + "', Port='" + std::to_string(c.server.port) +
       "', Timeout=" + std::to_string(c.timeoutSeconds) + ":Seconds, ";
  if (!c.clientCertificate.empty()) {
    s += "Certificate=PEM:[";
    Groundwork::AppendHex(c.clientCertificate, s);
    s += "], Public=PEM:[";
    Groundwork::AppendHex(c.clientCertificate, s);
    s += "], Private=PEM:[";
    Groundwork::AppendHex(c.clientPrivateKey.view(), s);
    s += "],";
  }
  s += "User_Trust, Authenticate}";
  for (const std::string& cert : c.trustedCertificates) {
    s += ", Trusted_Cert=PEM:[";
    Groundwork::AppendHex(cert, s);
    s += "]";
  }
  return out;
}

}  // namespace Qlc
