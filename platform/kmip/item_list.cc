#include "platform/kmip/item_list.h"

#include <cinttypes>
#include <cstdio>

namespace Qlc {

bool VaListSource::Next(std::string_view conversion, Groundwork::SecureString* out,
                        std::string* error) {
  char buf[32];
  int n = -1;
  if (conversion == "s") {
    const char* s = va_arg(args_, const char*);
    if (s == nullptr) {
      *error = "a null text was passed for %s";
      return false;
    }
    out->str().append(s);
    return true;
  }
  if (conversion == "d" || conversion == "i") {
    n = std::snprintf(buf, sizeof buf, "%d", va_arg(args_, int));
  } else if (conversion == "u") {
    n = std::snprintf(buf, sizeof buf, "%u", va_arg(args_, unsigned));
  } else if (conversion == "ld" || conversion == "li") {
    n = std::snprintf(buf, sizeof buf, "%ld", va_arg(args_, long));
  } else if (conversion == "lu") {
    n = std::snprintf(buf, sizeof buf, "%lu", va_arg(args_, unsigned long));
  } else if (conversion == "lld" || conversion == "lli") {
    n = std::snprintf(buf, sizeof buf, "%lld", va_arg(args_, long long));
  } else if (conversion == "llu") {
    n = std::snprintf(buf, sizeof buf, "%llu", va_arg(args_, unsigned long long));
  } else if (conversion == "zu") {
    n = std::snprintf(buf, sizeof buf, "%zu", va_arg(args_, size_t));
  } else {
    *error = "unsupported conversion %" + std::string(conversion);
    return false;
  }
  out->str().append(buf, static_cast<size_t>(n));
  return true;
}

namespace {

bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }
bool IsNameStart(char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c == '_'; }
bool IsNameChar(char c) { return IsNameStart(c) || (c >= '0' && c <= '9') || c == '-'; }
bool EndsBare(char c) {
  return IsBlank(c) || c == ',' || c == '{' || c == '}' || c == '\'' || c == '=';
}

class Parser {
 public:
  Parser(std::string_view text, ValueSource* source) : text_(text), source_(source) {}

  bool Top(std::vector<TextItem>* out) {
    if (!List(out, 0)) return false;
    if (pos_ != text_.size()) return Fail("expected ',' or the end of the text");
    return true;
  }

  const std::string& error() const { return error_; }

 private:
  bool AtEnd() const { return pos_ >= text_.size(); }
  char Peek() const { return AtEnd() ? '\0' : text_[pos_]; }
  void SkipBlanks() {
    while (!AtEnd() && IsBlank(text_[pos_])) ++pos_;
  }

  bool Fail(const std::string& what) {
    error_ = "at offset " + std::to_string(pos_) + ": " + what;
    return false;
  }

  // Items up to (not including) a '}' or the end of the text.
  bool List(std::vector<TextItem>* out, int depth) {
    SkipBlanks();
    if (AtEnd() || Peek() == '}') return true;
    while (true) {
      out->emplace_back();
      if (!Item(&out->back(), depth)) return false;
      SkipBlanks();
      if (Peek() != ',') return true;
      ++pos_;
      SkipBlanks();
    }
  }

  bool Item(TextItem* item, int depth) {
    item->offset = pos_;
    if (!IsNameStart(Peek())) return Fail("expected an item name");
    while (!AtEnd() && IsNameChar(text_[pos_])) item->name.push_back(text_[pos_++]);
    SkipBlanks();
    if (Peek() != '=') return true;
    ++pos_;
    SkipBlanks();
    item->hasValue = true;
    if (Peek() == '{') {
      if (depth + 1 >= kMaxListDepth) return Fail("lists nested too deeply");
      ++pos_;
      item->isList = true;
      if (!List(&item->list, depth + 1)) return false;
      if (Peek() != '}') return Fail("expected ',' or '}'");
      ++pos_;
      return true;
    }
    if (Peek() == '\'') {
      ++pos_;
      item->quoted = true;
      while (!AtEnd() && text_[pos_] != '\'') {
        if (!Char(&item->text)) return false;
      }
      if (AtEnd()) return Fail("unterminated quoted value of '" + item->name + "'");
      ++pos_;
      return true;
    }
    size_t start = pos_;
    while (!AtEnd() && !EndsBare(text_[pos_])) {
      if (!Char(&item->text)) return false;
    }
    if (pos_ == start) return Fail("missing value of '" + item->name + "'");
    return true;
  }

  // Consumes one character of a value, expanding a conversion.
  bool Char(Groundwork::SecureString* out) {
    char c = text_[pos_];
    if (c != '%' || source_ == nullptr) {
      out->str().push_back(c);
      ++pos_;
      return true;
    }
    size_t start = ++pos_;
    if (Peek() == '%') {
      out->str().push_back('%');
      ++pos_;
      return true;
    }
    while (Peek() == 'l' || Peek() == 'z') ++pos_;
    if (AtEnd()) return Fail("incomplete conversion");
    ++pos_;
    std::string conversion(text_.substr(start, pos_ - start));
    std::string why;
    if (!source_->Next(conversion, out, &why)) {
      pos_ = start - 1;
      return Fail(why);
    }
    return true;
  }

  std::string_view text_;
  ValueSource* source_;
  size_t pos_ = 0;
  std::string error_;
};

}  // namespace

bool ParseItemList(std::string_view text, ValueSource* source, std::vector<TextItem>* out,
                   std::string* error) {
  Parser parser(text, source);
  out->clear();
  if (!parser.Top(out)) {
    *error = parser.error();
    return false;
  }
  return true;
}

}  // namespace Qlc
