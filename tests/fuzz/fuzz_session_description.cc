// Feeds arbitrary text to the session-description parser (and, as a command
// template with fixed arguments, to the command parser). A description that
// parses must survive formatting and parsing again unchanged.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "platform/kmip/command.h"
#include "platform/kmip/session_description.h"

namespace {

// Answers every conversion with the same short text.
class FixedSource : public Qlc::ValueSource {
 public:
  bool Next(std::string_view conversion, Groundwork::SecureString* out,
            std::string* error) override {
    if (conversion != "s" && conversion != "d") {
      *error = "unsupported";
      return false;
    }
    out->str().append("v,}'");
    return true;
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view text(reinterpret_cast<const char*>(data), size);
  Qlc::SessionConfig config;
  std::string error;
  if (Qlc::ParseSessionDescription(text, &config, &error)) {
    Groundwork::SecureString again = Qlc::FormatSessionDescription(config);
    Qlc::SessionConfig second;
    if (!Qlc::ParseSessionDescription(again.view(), &second, &error) ||
        second.server.host != config.server.host || second.server.port != config.server.port ||
        second.trustedCertificates != config.trustedCertificates ||
        !(second.clientPrivateKey == config.clientPrivateKey)) {
      std::abort();
    }
  }
  FixedSource source;
  Qlc::Request request;
  Qlc::ParseCommand(text, &source, &request, &error);
  return 0;
}
