// TTLV codec and KMIP messages: exact request bytes, response decoding, and
// damaged input (every truncation, every bit flip) failing cleanly.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/kmip/messages.h"
#include "platform/kmip/ttlv.h"
#include "tests/support/hex.h"
#include "tests/support/kmip_messages.h"

namespace {

using Qlc::Operation;
using Qlc::Response;
using ZyrdTest::Unhex;
namespace T = Qlc::Ttlv::Tag;
namespace Kmip = ZyrdTest::Kmip;
using Bytes = std::vector<uint8_t>;

Qlc::Ttlv::Item DecodeOrFail(std::span<const uint8_t> bytes) {
  Qlc::Ttlv::Item root;
  std::string error;
  EXPECT_TRUE(Qlc::Ttlv::Decode(bytes, &root, &error)) << error;
  return root;
}

Bytes DiscoverVersionsRequest() {
  Qlc::Request r;
  r.operation = Operation::kDiscoverVersions;
  Groundwork::SecureBytes wire = Qlc::EncodeRequest(r);
  return Bytes(wire.begin(), wire.end());
}

TEST(KmipRequest, DiscoverVersionsMatchesWhatTheServerAccepts) {
  EXPECT_EQ(ZyrdTest::Hex(DiscoverVersionsRequest()),
            "42007801000000604200770100000038420069010000002042006a0200000004000000010000000042006"
            "b0200000004000000010000000042000d0200000004000000010000000042000f010000001842005c0500"
            "0000040000001e000000004200790100000000");
}

TEST(Ttlv, RejectsMalformedItemsAndLimitsDepthAndSizeWithTheReason) {
  auto nested = [](int depth) {
    Qlc::Ttlv::Writer w;
    for (int i = 0; i < depth; ++i) w.Begin(0x420001);
    for (int i = 0; i < depth; ++i) w.End();
    return Bytes(w.bytes().begin(), w.bytes().end());
  };
  Qlc::Ttlv::Writer big;
  big.Bytes(0x420001, Bytes(Qlc::Ttlv::kMaxMessageSize, 0));
  const std::pair<Bytes, const char*> cases[] = {
      {Unhex("420001 0b 00000000"), "unknown item type"},
      {Unhex("420001 02 00000008 0000000100000000"), "wrong length"},
      {Unhex("420001 02 00000004 0000000100000001"), "padding"},
      {Unhex("420001 07 00000001 4100000000000001"), "padding"},
      {Unhex("420001 07 00000002 4100000000000000"), "NUL"},
      {Unhex("420001 06 00000008 0000000000000002"), "boolean"},
      {Unhex("420001 04 00000004 00000001 00000000"), "big integer"},
      {Unhex("420001 01 00000018 420002 02 00000004 00000001 00000000"), "runs past"},
      {Unhex("420001 01 00000000 00000000 00000000"), "trailing"},
      {Unhex("420001 01 00000008 420002 02 00000004 00000001 00000000"), "runs past"},
      {Unhex("420001 01 0000"), "truncated"},
      {nested(Qlc::Ttlv::kMaxDepth + 1), "nested too deeply"},
      {Bytes(big.bytes().begin(), big.bytes().end()), "exceeds the limit"},
  };
  for (const auto& [bytes, fragment] : cases) {
    Qlc::Ttlv::Item item;
    std::string error;
    EXPECT_FALSE(Qlc::Ttlv::Decode(bytes, &item, &error)) << fragment;
    EXPECT_NE(error.find(fragment), std::string::npos) << fragment << ": " << error;
  }
  DecodeOrFail(nested(Qlc::Ttlv::kMaxDepth));
}

Operation OperationOf(const Bytes& message) {
  return static_cast<Operation>(
      DecodeOrFail(message).Find(T::kBatchItem)->Find(T::kOperation)->integer);
}

// Every cut is rejected; a flipped bit either yields an error or a response
// that still decodes and builds a tree, never a crash or an over-read (the
// fuzz build runs this under the sanitizers).
TEST(KmipResponse, EveryTruncationIsRejectedAndEveryBitFlipFailsCleanly) {
  size_t rejected = 0, total = 0;
  for (const Bytes& full :
       {Kmip::Versions({{2, 0}, {1, 4}, {1, 1}}), Kmip::Key("id-1", Bytes(32, 0xab)),
        Kmip::State("id-1", 3), Kmip::Failure(Operation::kGet, 1, "Not here")}) {
    const Operation op = OperationOf(full);
    Response r;
    std::string error;
    ASSERT_TRUE(Qlc::DecodeResponse(full, op, &r, &error)) << error;
    for (size_t n = 0; n < full.size(); ++n) {
      EXPECT_FALSE(Qlc::DecodeResponse(Bytes(full.begin(), full.begin() + n), op, &r, &error))
          << "length " << n;
    }
    for (size_t bit = 0; bit < full.size() * 8; ++bit, ++total) {
      Bytes damaged = full;
      damaged[bit / 8] ^= static_cast<uint8_t>(1u << (bit % 8));
      if (Qlc::DecodeResponse(damaged, op, &r, &error)) {
        Qlc::BuildTree(op, r.payload);
      } else {
        EXPECT_FALSE(error.empty());
        ++rejected;
      }
    }
  }
  // Header bytes (tags, types, lengths) dominate these messages.
  EXPECT_GT(rejected, total / 2);
}

TEST(KmipResponse, ChecksTheEnvelope) {
  Response r;
  std::string error;
  Bytes versions = Kmip::Versions({{1, 1}});
  EXPECT_FALSE(Qlc::DecodeResponse(versions, Operation::kGet, &r, &error));
  EXPECT_NE(error.find("answers operation 30 instead of 10"), std::string::npos) << error;

  Qlc::Ttlv::Item root = DecodeOrFail(versions);
  root.children.push_back(*root.Find(T::kBatchItem));
  Qlc::Ttlv::Writer twoItems;
  twoItems.Append(root);
  EXPECT_FALSE(Qlc::DecodeResponse(twoItems.bytes(), Operation::kDiscoverVersions, &r, &error));
  EXPECT_NE(error.find("exactly one batch item"), std::string::npos) << error;

  EXPECT_FALSE(
      Qlc::DecodeResponse(DiscoverVersionsRequest(), Operation::kDiscoverVersions, &r, &error));
  EXPECT_NE(error.find("not a response message"), std::string::npos) << error;

  ASSERT_TRUE(Qlc::DecodeResponse(Kmip::Failure(Operation::kGet, 12, "Denied\x01 for 'bob'"),
                                  Operation::kGet, &r, &error));
  EXPECT_EQ(r.resultStatus, 1u);
  EXPECT_EQ(r.resultReason, 12);
  EXPECT_EQ(Qlc::DescribeFailure(r),
            "operation failed: status 1 (Operation Failed), reason 12 (Permission Denied), "
            "message 'Denied? for 'bob''");
}

// The paths on real responses are shown through the library's sessions;
// these are the version texts and the empty cases.
TEST(KmipResponse, VersionTreesAndMissingPaths) {
  std::string error;
  auto treeOf = [&](const Bytes& message) {
    Response r;
    EXPECT_TRUE(Qlc::DecodeResponse(message, OperationOf(message), &r, &error)) << error;
    return Qlc::BuildTree(OperationOf(message), r.payload);
  };
  auto versions = treeOf(Kmip::Versions({{1, 4}, {1, 10}}));
  std::vector<std::string> texts;
  for (auto* v = Qlc::FindPath(versions->root, "Versions/", &error); v; v = v->next) {
    texts.emplace_back(v->bytes.begin(), v->bytes.end());
  }
  EXPECT_EQ(texts, (std::vector<std::string>{"1.4", "1.10"}));
  auto none = treeOf(Kmip::Versions({}));
  EXPECT_EQ(Qlc::FindPath(none->root, "Versions", &error), nullptr);
  EXPECT_EQ(Qlc::FindPath(none->root, "Versions//x", &error), nullptr);
  EXPECT_EQ(Qlc::FindPath(treeOf(Kmip::Key("k", {}, false))->root, "Symmetric_Key/Key", &error),
            nullptr);
  EXPECT_EQ(error, "no 'Symmetric_Key/Key' in the response");
}

}  // namespace
