// The C surface over the session, command and response-tree code. Every
// entry point catches exceptions (allocation failures) and turns them into
// QLC_E_RESOURCES, so nothing propagates into C callers.
#include "platform/kmip/qlkmipsimple.h"

#include <openssl/crypto.h>

#include <climits>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>

#include "platform/kmip/command.h"
#include "platform/kmip/handle.h"
#include "platform/kmip/messages.h"
#include "platform/kmip/response_tree.h"
#include "platform/kmip/session_description.h"
#include "platform/kmip/tls_channel.h"

struct qlc_session {
  static constexpr uint32_t kMagic = 0x716c6353;  // "qlcS"
  uint32_t magic = kMagic;
  Qlc::SessionConfig config;
  std::unique_ptr<Qlc::TlsChannel> channel;
  bool broken = false;  // an exchange broke off; the stream is out of step
  ~qlc_session() { magic = 0; }
};

namespace Qlc {
namespace {

struct Result : qlc_handle {
  Result() : qlc_handle{kResultMagic} {}
  ~Result() { magic = 0; }
  int number = 0;
  std::string explanation;
  std::unique_ptr<Tree> tree;  // successful perform only
  std::string serverCertPem;   // failed connect with an untrusted server only
};

qlc_result* MakeResult(int number, std::string explanation) {
  auto* r = new (std::nothrow) Result();
  if (r == nullptr) return nullptr;
  r->number = number;
  r->explanation = std::move(explanation);
  return r;
}

const Result* AsResult(const qlc_handle* h) {
  return h != nullptr && h->magic == kResultMagic ? static_cast<const Result*>(h) : nullptr;
}

const Node* AsNode(const qlc_handle* h) {
  return h != nullptr && h->magic == kNodeMagic ? static_cast<const Node*>(h) : nullptr;
}

// The node a look-up starts from: a node itself, or the root of a result's
// response tree.
const Node* StartNode(const qlc_handle* from) {
  if (const Node* n = AsNode(from)) return n;
  const Result* r = AsResult(from);
  return r != nullptr && r->tree ? &r->tree->root : nullptr;
}

// Buffers handed to callers carry a header so that qlc_free can wipe them.
struct AllocHeader {
  static constexpr uint64_t kMagic = 0x716c632d616c6c63;
  uint64_t magic;
  uint64_t size;
};

void* CopyOut(const void* data, size_t n, bool terminate) {
  size_t size = n + (terminate ? 1 : 0);
  auto* h = static_cast<AllocHeader*>(std::malloc(sizeof(AllocHeader) + size));
  if (h == nullptr) return nullptr;
  h->magic = AllocHeader::kMagic;
  h->size = size;
  auto* body = reinterpret_cast<unsigned char*>(h + 1);
  if (n > 0) std::memcpy(body, data, n);
  if (terminate) body[n] = 0;
  return body;
}

std::string PeerText(const SessionConfig& c) {
  const std::string& h = c.server.host;
  return (h.find(':') != std::string::npos ? "[" + h + "]" : h) + ":" +
         std::to_string(c.server.port);
}

int Fail(const Node* node, int number, std::string why) {
  if (node->tree != nullptr) node->tree->lookupError = std::move(why);
  return number;
}

int ValueOf(const char* path, const qlc_handle* from, const char* format, va_list args) {
  const Node* start = StartNode(from);
  if (start == nullptr || format == nullptr) return QLC_E_BAD_ARGUMENT;
  std::string where = path != nullptr && *path ? "'" + std::string(path) + "'" : "the node";
  std::string why;
  const Node* node = path != nullptr ? FindPath(*start, path, &why) : start;
  if (node == nullptr) return Fail(start, QLC_E_NOT_FOUND, why);
  std::string_view f = format;
  if (f == "d") {
    if (node->kind != Node::Kind::kInteger) {
      return Fail(node, QLC_E_WRONG_TYPE, where + " is not an integer");
    }
    if (node->integer < INT_MIN || node->integer > INT_MAX) {
      return Fail(node, QLC_E_WRONG_TYPE, where + " does not fit an int");
    }
    *va_arg(args, int*) = static_cast<int>(node->integer);
    return QLC_OK;
  }
  if (f == "bs") {
    if (node->kind != Node::Kind::kBytes && node->kind != Node::Kind::kText) {
      return Fail(node, QLC_E_WRONG_TYPE, where + " is not a byte string");
    }
    if (node->bytes.size() > INT_MAX) return Fail(node, QLC_E_WRONG_TYPE, where + " is too long");
    unsigned char** bytes = va_arg(args, unsigned char**);
    int* length = va_arg(args, int*);
    void* copy = CopyOut(node->bytes.data(), node->bytes.size(), false);
    if (copy == nullptr) return QLC_E_RESOURCES;
    *bytes = static_cast<unsigned char*>(copy);
    *length = static_cast<int>(node->bytes.size());
    return QLC_OK;
  }
  if (f == "%s" || f == "s") {
    std::string number;
    const void* data = node->bytes.data();
    size_t n = node->bytes.size();
    if (node->kind == Node::Kind::kInteger) {
      number = std::to_string(node->integer);
      data = number.data();
      n = number.size();
    } else if (node->kind != Node::Kind::kText) {
      return Fail(node, QLC_E_WRONG_TYPE, where + " is not a text");
    }
    void* copy = CopyOut(data, n, true);
    if (copy == nullptr) return QLC_E_RESOURCES;
    *va_arg(args, char**) = static_cast<char*>(copy);
    return QLC_OK;
  }
  return Fail(node, QLC_E_BAD_ARGUMENT, "unknown value format '" + std::string(f) + "'");
}

qlc_result* Perform(qlc_session* s, const char* command, va_list args) {
  if (s == nullptr || s->magic != qlc_session::kMagic) {
    return MakeResult(QLC_E_BAD_ARGUMENT, "not an open session");
  }
  if (command == nullptr) return MakeResult(QLC_E_BAD_ARGUMENT, "no command text");
  Request request;
  request.versionMajor = s->config.versionMajor;
  request.versionMinor = s->config.versionMinor;
  std::string error;
  {
    VaListSource source(args);
    if (!ParseCommand(command, &source, &request, &error)) {
      return MakeResult(QLC_E_BAD_COMMAND, error);
    }
  }
  if (s->broken || !s->channel) {
    return MakeResult(QLC_E_COMMUNICATION, "the session broke off in an earlier command");
  }
  Groundwork::SecureBytes wire = EncodeRequest(request);
  if (wire.size() > Ttlv::kMaxMessageSize) {
    return MakeResult(QLC_E_BAD_COMMAND, "invalid command: the request is too large");
  }
  std::string peer = PeerText(s->config);
  Failure f = s->channel->Send(wire);
  Groundwork::SecureBytes message;
  if (!f) f = s->channel->Receive(&message);
  if (f) {
    s->broken = true;
    return MakeResult(f.number, "key server " + peer + ": " + f.explanation);
  }
  Response response;
  if (!DecodeResponse(message, request.operation, &response, &error)) {
    return MakeResult(QLC_E_MALFORMED_RESPONSE, "key server " + peer + ": " + error);
  }
  if (response.resultStatus != kResultSuccess) {
    return MakeResult(QLC_E_OPERATION_FAILED,
                      "key server " + peer + ": " + DescribeFailure(response));
  }
  std::unique_ptr<Tree> tree = BuildTree(request.operation, response.payload);
  qlc_result* r = MakeResult(QLC_OK, "");
  if (r != nullptr) static_cast<Result*>(r)->tree = std::move(tree);
  return r;
}

qlc_result* Connect(qlc_session** session, const char* description) {
  if (session == nullptr) return MakeResult(QLC_E_BAD_ARGUMENT, "no place for the session handle");
  *session = nullptr;
  if (description == nullptr) return MakeResult(QLC_E_BAD_ARGUMENT, "no session description");
  auto s = std::make_unique<qlc_session>();
  std::string error;
  if (!ParseSessionDescription(description, &s->config, &error)) {
    return MakeResult(QLC_E_BAD_DESCRIPTION, error);
  }
  std::string server_cert;
  Failure f = TlsChannel::Open(s->config, &s->channel, &server_cert);
  if (f) {
    qlc_result* r =
        MakeResult(f.number, "key server " + PeerText(s->config) + ": " + f.explanation);
    if (r != nullptr) static_cast<Result*>(r)->serverCertPem = std::move(server_cert);
    return r;
  }
  *session = s.release();
  return MakeResult(QLC_OK, "");
}

}  // namespace
}  // namespace Qlc

using namespace Qlc;

extern "C" {

qlc_result* qlc_connect_key_manager(qlc_session** session, const char* description, ...) {
  try {
    return Connect(session, description);
  } catch (...) {
    return MakeResult(QLC_E_RESOURCES, "out of memory");
  }
}

int qlc_ok(const qlc_result* result) {
  const Result* r = AsResult(result);
  return r != nullptr ? r->number : (result == nullptr ? QLC_E_RESOURCES : QLC_E_BAD_ARGUMENT);
}

const char* qlc_explain(const qlc_result* result) {
  const Result* r = AsResult(result);
  if (r == nullptr) return result == nullptr ? "no result (out of memory)" : "not a result handle";
  if (r->number != QLC_OK) return r->explanation.c_str();
  return r->tree ? r->tree->lookupError.c_str() : "";
}

void qlc_release(qlc_result* result) {
  if (const Result* r = AsResult(result)) delete r;
}

void qlc_disconnect_key_manager(qlc_session* session) {
  if (session == nullptr || session->magic != qlc_session::kMagic) return;
  delete session;
}

qlc_result* qlc_perform(qlc_session* session, const char* command, ...) {
  va_list args;
  va_start(args, command);
  qlc_result* r;
  try {
    r = Perform(session, command, args);
  } catch (...) {
    r = MakeResult(QLC_E_RESOURCES, "out of memory");
  }
  va_end(args);
  return r;
}

int qlc_value_of(const char* path, const qlc_handle* from, const char* format, ...) {
  va_list args;
  va_start(args, format);
  int n;
  try {
    n = ValueOf(path, from, format, args);
  } catch (...) {
    n = QLC_E_RESOURCES;
  }
  va_end(args);
  return n;
}

const qlc_node* qlc_find(const char* path, const qlc_handle* from) {
  const Node* start = StartNode(from);
  if (start == nullptr || path == nullptr) return nullptr;
  try {
    std::string why;
    const Node* node = FindPath(*start, path, &why);
    if (node == nullptr && start->tree != nullptr) start->tree->lookupError = why;
    return node;
  } catch (...) {
    return nullptr;
  }
}

const qlc_node* qlc_next(const qlc_node* node) {
  const Node* n = AsNode(node);
  return n != nullptr ? n->next : nullptr;
}

void qlc_free(void* pointer) {
  if (pointer == nullptr) return;
  auto* h = static_cast<AllocHeader*>(pointer) - 1;
  if (h->magic != AllocHeader::kMagic) return;
  OPENSSL_cleanse(pointer, h->size);
  h->magic = 0;
  std::free(h);
}

int qlc_fetch_server_credentials(const qlc_result* result, qlc_server_credentials** credentials) {
  if (credentials == nullptr) return QLC_E_BAD_ARGUMENT;
  *credentials = nullptr;
  const Result* r = AsResult(result);
  if (r == nullptr) return QLC_E_BAD_ARGUMENT;
  if (r->serverCertPem.empty()) return QLC_E_NO_SERVER_CREDENTIALS;
  size_t n = r->serverCertPem.size();
  auto* c =
      static_cast<qlc_server_credentials*>(std::malloc(sizeof(qlc_server_credentials) + n + 1));
  if (c == nullptr) return QLC_E_RESOURCES;
  auto* data = reinterpret_cast<unsigned char*>(c + 1);
  std::memcpy(data, r->serverCertPem.data(), n);
  data[n] = 0;
  c->format = QLC_CERT_FORMAT_PEM;
  c->data = data;
  c->length = static_cast<uint32_t>(n);
  *credentials = c;
  return QLC_OK;
}

void qlc_free_credentials(qlc_server_credentials* credentials) { std::free(credentials); }

}  // extern "C"
