// KMIP TTLV (tag, type, length, value) encoding as pure functions over bytes.
//
// Decode() turns one complete encoded item into an Item tree and checks
// everything a peer could get wrong: the type code, the length of each
// fixed-size type, lengths that run past their parent, the zero padding to
// eight bytes, embedded NULs in text, the nesting depth and the total size.
// Writer builds encodings. Nothing here does I/O; all functions are
// thread-safe. Byte and text values live in wiping buffers because key
// material passes through them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/util/secure_buffer.h"

namespace Qlc::Ttlv {

enum class Type : uint8_t {
  kStructure = 0x01,
  kInteger = 0x02,
  kLongInteger = 0x03,
  kBigInteger = 0x04,
  kEnumeration = 0x05,
  kBoolean = 0x06,
  kTextString = 0x07,
  kByteString = 0x08,
  kDateTime = 0x09,
  kInterval = 0x0A,
};

// The tags this library reads or writes.
namespace Tag {
inline constexpr uint32_t kAttribute = 0x420008;
inline constexpr uint32_t kAttributeIndex = 0x420009;
inline constexpr uint32_t kAttributeName = 0x42000A;
inline constexpr uint32_t kAttributeValue = 0x42000B;
inline constexpr uint32_t kAuthentication = 0x42000C;
inline constexpr uint32_t kBatchCount = 0x42000D;
inline constexpr uint32_t kBatchItem = 0x42000F;
inline constexpr uint32_t kCredential = 0x420023;
inline constexpr uint32_t kCredentialType = 0x420024;
inline constexpr uint32_t kCredentialValue = 0x420025;
inline constexpr uint32_t kCryptographicAlgorithm = 0x420028;
inline constexpr uint32_t kCryptographicLength = 0x42002A;
inline constexpr uint32_t kKeyBlock = 0x420040;
inline constexpr uint32_t kKeyFormatType = 0x420042;
inline constexpr uint32_t kKeyMaterial = 0x420043;
inline constexpr uint32_t kKeyValue = 0x420045;
inline constexpr uint32_t kKeyWrappingData = 0x420046;
inline constexpr uint32_t kObjectType = 0x420057;
inline constexpr uint32_t kOperation = 0x42005C;
inline constexpr uint32_t kProtocolVersion = 0x420069;
inline constexpr uint32_t kProtocolVersionMajor = 0x42006A;
inline constexpr uint32_t kProtocolVersionMinor = 0x42006B;
inline constexpr uint32_t kRequestHeader = 0x420077;
inline constexpr uint32_t kRequestMessage = 0x420078;
inline constexpr uint32_t kRequestPayload = 0x420079;
inline constexpr uint32_t kResponseHeader = 0x42007A;
inline constexpr uint32_t kResponseMessage = 0x42007B;
inline constexpr uint32_t kResponsePayload = 0x42007C;
inline constexpr uint32_t kResultMessage = 0x42007D;
inline constexpr uint32_t kResultReason = 0x42007E;
inline constexpr uint32_t kResultStatus = 0x42007F;
inline constexpr uint32_t kState = 0x42008D;
inline constexpr uint32_t kSymmetricKey = 0x42008F;
inline constexpr uint32_t kTimeStamp = 0x420092;
inline constexpr uint32_t kUniqueIdentifier = 0x420094;
inline constexpr uint32_t kUsername = 0x420099;
inline constexpr uint32_t kPassword = 0x4200A1;
}  // namespace Tag

// Size of the tag, type and length fields that precede every value.
inline constexpr size_t kHeaderSize = 8;
// Largest message this library accepts or writes, header included.
inline constexpr size_t kMaxMessageSize = 256 * 1024;
// Deepest nesting of structures accepted (the outermost message is depth 1).
inline constexpr int kMaxDepth = 16;

struct Item {
  uint32_t tag = 0;
  Type type = Type::kStructure;
  // Integer, Long Integer, Enumeration, Boolean (0 or 1), Date-Time, Interval.
  int64_t integer = 0;
  // Text String, Byte String and Big Integer (two's complement, big-endian).
  Groundwork::SecureBytes bytes;
  // Structure members in wire order.
  std::vector<Item> children;

  // First member with `tag`, or null.
  const Item* Find(uint32_t tag) const;
  // Number of members with `tag`.
  size_t Count(uint32_t tag) const;
  std::string_view Text() const {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
  }
  bool IsIntegral() const;
};

// Reads the header of an encoded item: its tag, type and value length.
// False when fewer than kHeaderSize bytes are given or the type is unknown.
bool ReadHeader(std::span<const uint8_t> data, uint32_t* tag, Type* type, uint32_t* length);

// Decodes `data`, which must hold exactly one item (value and padding
// included). On failure returns false and sets `error` to a reason that names
// the offset; `out` is then unspecified.
bool Decode(std::span<const uint8_t> data, Item* out, std::string* error);

// Builds an encoding front to back. Structures are opened and closed in
// nesting order; their lengths are filled in when they close.
class Writer {
 public:
  void Begin(uint32_t tag);
  void End();
  void Integer(uint32_t tag, int32_t value);
  void LongInteger(uint32_t tag, int64_t value);
  void Enumeration(uint32_t tag, uint32_t value);
  void Boolean(uint32_t tag, bool value);
  void DateTime(uint32_t tag, int64_t seconds);
  void Text(uint32_t tag, std::string_view text);
  void Bytes(uint32_t tag, std::span<const uint8_t> bytes);
  // Appends the encoding of an already decoded item.
  void Append(const Item& item);

  // The encoding; every structure must have been closed.
  const Groundwork::SecureBytes& bytes() const { return out_; }
  Groundwork::SecureBytes Take() { return std::move(out_); }

 private:
  void Header(uint32_t tag, Type type, uint32_t length);
  void Raw(const void* data, size_t n);
  void Pad(size_t n);
  void Be(uint64_t value, int width);

  Groundwork::SecureBytes out_;
  std::vector<size_t> open_;
};

}  // namespace Qlc::Ttlv
