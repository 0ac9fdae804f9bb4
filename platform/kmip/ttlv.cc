#include "platform/kmip/ttlv.h"

#include <cstring>

namespace Qlc::Ttlv {

const Item* Item::Find(uint32_t wanted) const {
  for (const Item& c : children) {
    if (c.tag == wanted) return &c;
  }
  return nullptr;
}

size_t Item::Count(uint32_t wanted) const {
  size_t n = 0;
  for (const Item& c : children) n += c.tag == wanted;
  return n;
}

bool Item::IsIntegral() const {
  switch (type) {
    case Type::kInteger:
    case Type::kLongInteger:
    case Type::kEnumeration:
    case Type::kBoolean:
    case Type::kDateTime:
    case Type::kInterval:
      return true;
    default:
      return false;
  }
}

namespace {

uint64_t ReadBe(const uint8_t* p, int width) {
  uint64_t v = 0;
  for (int i = 0; i < width; ++i) v = (v << 8) | p[i];
  return v;
}

size_t Padded(size_t n) { return (n + 7) & ~size_t{7}; }

bool AllZero(const uint8_t* p, size_t n) {
  for (size_t i = 0; i < n; ++i) {
    if (p[i] != 0) return false;
  }
  return true;
}

class Decoder {
 public:
  explicit Decoder(std::span<const uint8_t> data) : data_(data) {}

  // Decodes the item at `offset`, whose encoding (padding included) must end
  // at or before `limit`; sets `next` to the offset after it.
  bool Item(size_t offset, size_t limit, int depth, Ttlv::Item* out, size_t* next) {
    if (depth > kMaxDepth) return Fail(offset, "structures nested too deeply");
    if (limit - offset < kHeaderSize) return Fail(offset, "truncated item header");
    uint32_t length = 0;
    if (!ReadHeader(data_.subspan(offset, kHeaderSize), &out->tag, &out->type, &length)) {
      return Fail(offset + 3, "unknown item type");
    }
    size_t value = offset + kHeaderSize;
    size_t room = limit - value;
    size_t padded = Padded(length);
    if (length > room || padded > room) return Fail(offset + 4, "item length runs past its end");
    const uint8_t* p = data_.data() + value;
    *next = value + padded;
    switch (out->type) {
      case Type::kStructure: {
        size_t end = value + length;
        if (padded != length) return Fail(offset + 4, "structure length not a multiple of 8");
        size_t at = value;
        while (at < end) {
          out->children.emplace_back();
          if (!Item(at, end, depth + 1, &out->children.back(), &at)) return false;
        }
        return true;
      }
      case Type::kInteger:
      case Type::kEnumeration:
      case Type::kInterval: {
        if (length != 4) return Fail(offset + 4, "wrong length for a 4-byte value");
        if (!AllZero(p + 4, 4)) return Fail(value + 4, "padding bytes not zero");
        uint32_t v = static_cast<uint32_t>(ReadBe(p, 4));
        out->integer = out->type == Type::kInteger ? static_cast<int64_t>(static_cast<int32_t>(v))
                                                   : static_cast<int64_t>(v);
        return true;
      }
      case Type::kLongInteger:
      case Type::kDateTime:
      case Type::kBoolean: {
        if (length != 8) return Fail(offset + 4, "wrong length for an 8-byte value");
        out->integer = static_cast<int64_t>(ReadBe(p, 8));
        if (out->type == Type::kBoolean && out->integer != 0 && out->integer != 1) {
          return Fail(value, "boolean value neither 0 nor 1");
        }
        return true;
      }
      case Type::kBigInteger:
        if (length == 0 || length % 8 != 0) {
          return Fail(offset + 4, "big integer length not a positive multiple of 8");
        }
        out->bytes.assign(p, p + length);
        return true;
      case Type::kTextString:
        if (std::memchr(p, 0, length) != nullptr) return Fail(value, "NUL byte in text");
        [[fallthrough]];
      case Type::kByteString:
        if (!AllZero(p + length, padded - length))
          return Fail(value + length, "padding bytes not zero");
        out->bytes.assign(p, p + length);
        return true;
    }
    return Fail(offset + 3, "unknown item type");
  }

  bool Fail(size_t offset, const char* what) {
    error_ = "malformed TTLV at offset " + std::to_string(offset) + ": " + what;
    return false;
  }

  const std::string& error() const { return error_; }

 private:
  std::span<const uint8_t> data_;
  std::string error_;
};

}  // namespace

bool ReadHeader(std::span<const uint8_t> data, uint32_t* tag, Type* type, uint32_t* length) {
  if (data.size() < kHeaderSize) return false;
  uint8_t t = data[3];
  if (t < static_cast<uint8_t>(Type::kStructure) || t > static_cast<uint8_t>(Type::kInterval)) {
    return false;
  }
  *tag = static_cast<uint32_t>(ReadBe(data.data(), 3));
  *type = static_cast<Type>(t);
  *length = static_cast<uint32_t>(ReadBe(data.data() + 4, 4));
  return true;
}

bool Decode(std::span<const uint8_t> data, Item* out, std::string* error) {
  if (data.size() > kMaxMessageSize) {
    *error = "TTLV message of " + std::to_string(data.size()) + " bytes exceeds the limit of " +
             std::to_string(kMaxMessageSize);
    return false;
  }
  Decoder decoder(data);
  size_t next = 0;
  *out = Item();
  if (!decoder.Item(0, data.size(), 1, out, &next)) {
    *error = decoder.error();
    return false;
  }
  if (next != data.size()) {
    *error = "malformed TTLV at offset " + std::to_string(next) + ": trailing bytes after the item";
    return false;
  }
  return true;
}

void Writer::Begin(uint32_t tag) {
  Header(tag, Type::kStructure, 0);
  open_.push_back(out_.size());
}

void Writer::End() {
  size_t start = open_.back();
  open_.pop_back();
  uint64_t length = out_.size() - start;
  for (int i = 0; i < 4; ++i) out_[start - 4 + i] = static_cast<uint8_t>(length >> (24 - 8 * i));
}

void Writer::Integer(uint32_t tag, int32_t value) {
  Header(tag, Type::kInteger, 4);
  Be(static_cast<uint32_t>(value), 4);
  Pad(4);
}

void Writer::LongInteger(uint32_t tag, int64_t value) {
  Header(tag, Type::kLongInteger, 8);
  Be(static_cast<uint64_t>(value), 8);
}

void Writer::Enumeration(uint32_t tag, uint32_t value) {
  Header(tag, Type::kEnumeration, 4);
  Be(value, 4);
  Pad(4);
}

void Writer::Boolean(uint32_t tag, bool value) {
  Header(tag, Type::kBoolean, 8);
  Be(value ? 1 : 0, 8);
}

void Writer::DateTime(uint32_t tag, int64_t seconds) {
  Header(tag, Type::kDateTime, 8);
  Be(static_cast<uint64_t>(seconds), 8);
}

void Writer::Text(uint32_t tag, std::string_view text) {
  Header(tag, Type::kTextString, static_cast<uint32_t>(text.size()));
  Raw(text.data(), text.size());
  Pad(Padded(text.size()) - text.size());
}

void Writer::Bytes(uint32_t tag, std::span<const uint8_t> bytes) {
  Header(tag, Type::kByteString, static_cast<uint32_t>(bytes.size()));
  Raw(bytes.data(), bytes.size());
  Pad(Padded(bytes.size()) - bytes.size());
}

void Writer::Append(const Item& item) {
  switch (item.type) {
    case Type::kStructure:
      Begin(item.tag);
      for (const Item& c : item.children) Append(c);
      End();
      return;
    case Type::kInteger:
      return Integer(item.tag, static_cast<int32_t>(item.integer));
    case Type::kEnumeration:
      return Enumeration(item.tag, static_cast<uint32_t>(item.integer));
    case Type::kInterval:
      Header(item.tag, item.type, 4);
      Be(static_cast<uint64_t>(item.integer), 4);
      return Pad(4);
    case Type::kLongInteger:
    case Type::kDateTime:
    case Type::kBoolean:
      Header(item.tag, item.type, 8);
      return Be(static_cast<uint64_t>(item.integer), 8);
    case Type::kBigInteger:
      Header(item.tag, item.type, static_cast<uint32_t>(item.bytes.size()));
      return Raw(item.bytes.data(), item.bytes.size());
    case Type::kTextString:
      return Text(item.tag, item.Text());
    case Type::kByteString:
      return Bytes(item.tag, item.bytes);
  }
}

void Writer::Header(uint32_t tag, Type type, uint32_t length) {
  Be(tag, 3);
  out_.push_back(static_cast<uint8_t>(type));
  Be(length, 4);
}

void Writer::Raw(const void* data, size_t n) {
  const uint8_t* p = static_cast<const uint8_t*>(data);
  out_.insert(out_.end(), p, p + n);
}

void Writer::Pad(size_t n) { out_.insert(out_.end(), n, 0); }

void Writer::Be(uint64_t value, int width) {
  for (int i = width - 1; i >= 0; --i) out_.push_back(static_cast<uint8_t>(value >> (8 * i)));
}

}  // namespace Qlc::Ttlv
