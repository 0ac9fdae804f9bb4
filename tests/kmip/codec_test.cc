// TTLV codec and KMIP messages: exact request bytes, response decoding, and
// damaged input (every truncation, every bit flip) failing cleanly.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/kmip/messages.h"
#include "platform/kmip/ttlv.h"
#include "tests/support/kmip_messages.h"

namespace {

using Qlc::Operation;
using Qlc::Request;
using Qlc::Response;
namespace T = Qlc::Ttlv::Tag;
using Bytes = std::vector<uint8_t>;

std::string Hex(const Groundwork::SecureBytes& b) {
  static const char* d = "0123456789abcdef";
  std::string s;
  for (uint8_t c : b) {
    s.push_back(d[c >> 4]);
    s.push_back(d[c & 15]);
  }
  return s;
}

Bytes FromHex(const std::string& hex) {
  Bytes b;
  for (size_t i = 0; i < hex.size(); i += 2) b.push_back(std::stoi(hex.substr(i, 2), nullptr, 16));
  return b;
}

TEST(KmipRequest, DiscoverVersionsMatchesWhatTheServerAccepts) {
  Request r;
  r.operation = Operation::kDiscoverVersions;
  EXPECT_EQ(Hex(Qlc::EncodeRequest(r)),
            "42007801000000604200770100000038420069010000002042006a0200000004000000010000000042006"
            "b0200000004000000010000000042000d0200000004000000010000000042000f010000001842005c0500"
            "0000040000001e000000004200790100000000");
}

TEST(KmipRequest, GetCarriesIdRawFormatAndCredentialInTheHeader) {
  Request r;
  r.operation = Operation::kGet;
  r.uniqueIdentifier = "key-1";
  r.withCredential = true;
  r.username.assign("alice");
  r.password.assign("s3cret, {x}");
  Groundwork::SecureBytes wire = Qlc::EncodeRequest(r);

  Qlc::Ttlv::Item root;
  std::string error;
  ASSERT_TRUE(Qlc::Ttlv::Decode(wire, &root, &error)) << error;
  const auto* header = root.Find(T::kRequestHeader);
  ASSERT_NE(header, nullptr);
  // Authentication sits between the protocol version and the batch count.
  ASSERT_EQ(header->children.size(), 3u);
  EXPECT_EQ(header->children[1].tag, T::kAuthentication);
  const auto* cred = header->children[1].Find(T::kCredential);
  ASSERT_NE(cred, nullptr);
  EXPECT_EQ(cred->Find(T::kCredentialType)->integer, 1);

  ZyrdTest::Kmip::SeenRequest seen = ZyrdTest::Kmip::ReadRequest(Bytes(wire.begin(), wire.end()));
  ASSERT_TRUE(seen.valid);
  EXPECT_EQ(seen.operation, Operation::kGet);
  EXPECT_EQ(seen.id, "key-1");
  EXPECT_EQ(seen.username, "alice");
  EXPECT_EQ(seen.password, "s3cret, {x}");
  const auto* payload = root.Find(T::kBatchItem)->Find(T::kRequestPayload);
  EXPECT_EQ(payload->Find(T::kKeyFormatType)->integer, 1);  // Raw
}

TEST(KmipRequest, GetAttributesNamesEachAttributeAndOmitsCredentialByDefault) {
  Request r;
  r.operation = Operation::kGetAttributes;
  r.uniqueIdentifier = "7";
  r.attributeNames = {"State", "Name"};
  Groundwork::SecureBytes wire = Qlc::EncodeRequest(r);
  ZyrdTest::Kmip::SeenRequest seen = ZyrdTest::Kmip::ReadRequest(Bytes(wire.begin(), wire.end()));
  ASSERT_TRUE(seen.valid);
  EXPECT_FALSE(seen.hasCredential);
  EXPECT_EQ(seen.attributeNames, (std::vector<std::string>{"State", "Name"}));
}

// Every value type round-trips through Writer and Decode.
TEST(Ttlv, WriterAndDecoderAgreeOnEveryType) {
  Qlc::Ttlv::Writer w;
  w.Begin(0x420001);
  w.Integer(0x420002, -5);
  w.LongInteger(0x420003, -1234567890123);
  w.Enumeration(0x420004, 0xfffffffe);
  w.Boolean(0x420005, true);
  w.DateTime(0x420006, 1700000000);
  w.Text(0x420007, "abcdefghi");
  w.Bytes(0x420008, Bytes{1, 2, 3});
  w.End();
  Qlc::Ttlv::Item root;
  std::string error;
  ASSERT_TRUE(Qlc::Ttlv::Decode(w.bytes(), &root, &error)) << error;
  ASSERT_EQ(root.children.size(), 7u);
  EXPECT_EQ(root.children[0].integer, -5);
  EXPECT_EQ(root.children[1].integer, -1234567890123);
  EXPECT_EQ(root.children[2].integer, 0xfffffffe);
  EXPECT_EQ(root.children[3].integer, 1);
  EXPECT_EQ(root.children[5].Text(), "abcdefghi");
  EXPECT_EQ(Bytes(root.children[6].bytes.begin(), root.children[6].bytes.end()), (Bytes{1, 2, 3}));
  Qlc::Ttlv::Writer again;
  again.Append(root);
  EXPECT_EQ(again.bytes(), w.bytes());
}

struct BadCase {
  const char* name;
  std::string hex;
  const char* fragment;
};

TEST(Ttlv, RejectsMalformedItemsWithTheReason) {
  const BadCase cases[] = {
      {"unknown type", "420001 0b 00000000", "unknown item type"},
      {"integer length", "420001 02 00000008 0000000100000000", "wrong length"},
      {"integer padding", "420001 02 00000004 0000000100000001", "padding"},
      {"text padding", "420001 07 00000001 4100000000000001", "padding"},
      {"NUL in text", "420001 07 00000002 4100000000000000", "NUL"},
      {"boolean value", "420001 06 00000008 0000000000000002", "boolean"},
      {"big integer length", "420001 04 00000004 00000001 00000000", "big integer"},
      {"length past end", "420001 01 00000018 420002 02 00000004 00000001 00000000", "runs past"},
      {"trailing bytes", "420001 01 00000000 00000000 00000000", "trailing"},
      {"child overruns parent", "420001 01 00000008 420002 02 00000004 00000001 00000000",
       "runs past"},
      {"short header", "420001 01 0000", "truncated"},
  };
  for (const BadCase& c : cases) {
    std::string hex;
    for (char ch : c.hex) {
      if (ch != ' ') hex.push_back(ch);
    }
    Qlc::Ttlv::Item item;
    std::string error;
    EXPECT_FALSE(Qlc::Ttlv::Decode(FromHex(hex), &item, &error)) << c.name;
    EXPECT_NE(error.find(c.fragment), std::string::npos) << c.name << ": " << error;
  }
}

TEST(Ttlv, LimitsNestingDepthAndMessageSize) {
  Qlc::Ttlv::Writer deep;
  for (int i = 0; i < Qlc::Ttlv::kMaxDepth + 1; ++i) deep.Begin(0x420001);
  for (int i = 0; i < Qlc::Ttlv::kMaxDepth + 1; ++i) deep.End();
  Qlc::Ttlv::Item item;
  std::string error;
  EXPECT_FALSE(Qlc::Ttlv::Decode(deep.bytes(), &item, &error));
  EXPECT_NE(error.find("nested too deeply"), std::string::npos) << error;

  Qlc::Ttlv::Writer ok;
  for (int i = 0; i < Qlc::Ttlv::kMaxDepth; ++i) ok.Begin(0x420001);
  for (int i = 0; i < Qlc::Ttlv::kMaxDepth; ++i) ok.End();
  EXPECT_TRUE(Qlc::Ttlv::Decode(ok.bytes(), &item, &error)) << error;

  Qlc::Ttlv::Writer big;
  big.Bytes(0x420001, Bytes(Qlc::Ttlv::kMaxMessageSize, 0));
  EXPECT_FALSE(Qlc::Ttlv::Decode(big.bytes(), &item, &error));
  EXPECT_NE(error.find("exceeds the limit"), std::string::npos) << error;
}

std::vector<Bytes> ValidResponses() {
  return {ZyrdTest::Kmip::Versions({{2, 0}, {1, 4}, {1, 1}}),
          ZyrdTest::Kmip::Key("id-1", Bytes(32, 0xab)), ZyrdTest::Kmip::State("id-1", 3),
          ZyrdTest::Kmip::Failure(Operation::kGet, 1, "Could not locate object")};
}

Operation OperationOf(const Bytes& message) {
  Qlc::Ttlv::Item root;
  std::string error;
  Qlc::Ttlv::Decode(message, &root, &error);
  return static_cast<Operation>(root.Find(T::kBatchItem)->Find(T::kOperation)->integer);
}

TEST(KmipResponse, EveryTruncationIsRejected) {
  for (const Bytes& full : ValidResponses()) {
    Operation op = OperationOf(full);
    Response r;
    std::string error;
    ASSERT_TRUE(Qlc::DecodeResponse(full, op, &r, &error)) << error;
    for (size_t n = 0; n < full.size(); ++n) {
      Bytes cut(full.begin(), full.begin() + n);
      EXPECT_FALSE(Qlc::DecodeResponse(cut, op, &r, &error)) << "length " << n;
    }
  }
}

// A flipped bit either yields an error or a response that still decodes and
// builds a tree; never a crash or an over-read (run under the sanitizers in
// the fuzz build).
TEST(KmipResponse, EveryBitFlipFailsCleanlyOrStillDecodes) {
  size_t rejected = 0, total = 0;
  for (const Bytes& full : ValidResponses()) {
    Operation op = OperationOf(full);
    for (size_t bit = 0; bit < full.size() * 8; ++bit) {
      Bytes damaged = full;
      damaged[bit / 8] ^= static_cast<uint8_t>(1u << (bit % 8));
      Response r;
      std::string error;
      ++total;
      if (!Qlc::DecodeResponse(damaged, op, &r, &error)) {
        EXPECT_FALSE(error.empty());
        ++rejected;
        continue;
      }
      Qlc::BuildTree(op, r.payload);
    }
  }
  // Header bytes (tags, types, lengths) dominate these messages.
  EXPECT_GT(rejected, total / 2);
}

TEST(KmipResponse, ChecksTheEnvelope) {
  using ZyrdTest::Kmip::PayloadWriter;
  Response r;
  std::string error;
  Bytes versions = ZyrdTest::Kmip::Versions({{1, 1}});
  EXPECT_FALSE(Qlc::DecodeResponse(versions, Operation::kGet, &r, &error));
  EXPECT_NE(error.find("answers operation 30 instead of 10"), std::string::npos) << error;

  // Two batch items.
  Qlc::Ttlv::Item root;
  ASSERT_TRUE(Qlc::Ttlv::Decode(versions, &root, &error));
  root.children.push_back(*root.Find(T::kBatchItem));
  Qlc::Ttlv::Writer w;
  w.Append(root);
  EXPECT_FALSE(Qlc::DecodeResponse(w.bytes(), Operation::kDiscoverVersions, &r, &error));
  EXPECT_NE(error.find("exactly one batch item"), std::string::npos) << error;

  // A request is not a response.
  Request req;
  EXPECT_FALSE(
      Qlc::DecodeResponse(Qlc::EncodeRequest(req), Operation::kDiscoverVersions, &r, &error));
  EXPECT_NE(error.find("not a response message"), std::string::npos) << error;
}

TEST(KmipResponse, FailureCarriesStatusReasonAndCleanedMessage) {
  Response r;
  std::string error;
  ASSERT_TRUE(
      Qlc::DecodeResponse(ZyrdTest::Kmip::Failure(Operation::kGet, 12, "Denied\x01 for 'bob'"),
                          Operation::kGet, &r, &error));
  EXPECT_EQ(r.resultStatus, 1u);
  EXPECT_EQ(r.resultReason, 12);
  EXPECT_EQ(Qlc::DescribeFailure(r),
            "operation failed: status 1 (Operation Failed), reason 12 (Permission Denied), "
            "message 'Denied? for 'bob''");
}

TEST(KmipResponse, TreesOfferTheDocumentedPaths) {
  std::string error;
  auto tree_of = [&](const Bytes& message) {
    Response r;
    EXPECT_TRUE(Qlc::DecodeResponse(message, OperationOf(message), &r, &error)) << error;
    return Qlc::BuildTree(OperationOf(message), r.payload);
  };
  auto key = tree_of(ZyrdTest::Kmip::Key("k", Bytes{9, 8, 7}));
  const Qlc::Node* n = Qlc::FindPath(key->root, "Symmetric_Key/Key", &error);
  ASSERT_NE(n, nullptr) << error;
  EXPECT_EQ(Bytes(n->bytes.begin(), n->bytes.end()), (Bytes{9, 8, 7}));
  EXPECT_EQ(Qlc::FindPath(key->root, "Symmetric_Key/Length", &error)->integer, 24);

  auto nokey = tree_of(ZyrdTest::Kmip::KeyWithoutMaterial("k"));
  EXPECT_NE(Qlc::FindPath(nokey->root, "Symmetric_Key", &error), nullptr);
  EXPECT_EQ(Qlc::FindPath(nokey->root, "Symmetric_Key/Key", &error), nullptr);
  EXPECT_EQ(error, "no 'Symmetric_Key/Key' in the response");

  auto state = tree_of(ZyrdTest::Kmip::State("k", 6));
  EXPECT_EQ(Qlc::FindPath(state->root, "Attributes/State", &error)->integer, 6);

  auto versions = tree_of(ZyrdTest::Kmip::Versions({{1, 4}, {1, 10}}));
  const Qlc::Node* v = Qlc::FindPath(versions->root, "Versions/", &error);
  ASSERT_NE(v, nullptr);
  std::vector<std::string> texts;
  for (; v != nullptr; v = v->next) texts.emplace_back(v->bytes.begin(), v->bytes.end());
  EXPECT_EQ(texts, (std::vector<std::string>{"1.4", "1.10"}));

  auto none = tree_of(ZyrdTest::Kmip::Versions({}));
  EXPECT_EQ(Qlc::FindPath(none->root, "Versions", &error), nullptr);
  EXPECT_EQ(Qlc::FindPath(none->root, "Versions//x", &error), nullptr);
}

}  // namespace
