// The comma-separated item lists shared by session descriptions and command
// texts, e.g. "Get, Object, Id=%s" or "Session = {Protocol=SSL, Host='h'}".
//
//   list  := [item (',' item)*]            blanks allowed around every token
//   item  := name ['=' value]              name: letter or '_', then letters,
//                                          digits, '_' or '-'
//   value := '{' list '}'                  nested list (depth-limited)
//          | "'" any text but "'" "'"       quoted text
//          | bare text                     up to a blank or one of ,{}'=
//
// When a ValueSource is given, printf conversions inside values (%s, %d, %i,
// %u with the l, ll or z modifiers, and %% for a percent sign) are replaced,
// left to right, by the source's next argument; the substituted text is never
// scanned again, so arguments may hold any character. Without a source a '%'
// is an ordinary character. Values are kept in wiping strings because they
// carry passwords and private keys. Parsing is a pure function.
#pragma once

#include <cstdarg>
#include <string>
#include <string_view>
#include <vector>

#include "platform/util/secure_buffer.h"

namespace Qlc {

struct TextItem {
  std::string name;
  size_t offset = 0;              // where the name starts in the parsed text
  bool hasValue = false;          // "name=value" rather than a bare "name"
  bool isList = false;            // the value is a nested list
  bool quoted = false;            // the value was written in single quotes
  Groundwork::SecureString text;  // the value text (not for lists)
  std::vector<TextItem> list;     // the nested items (lists only)
};

// Supplies the arguments of printf conversions.
class ValueSource {
 public:
  virtual ~ValueSource() = default;
  // Appends the next argument, formatted for `conversion` ("s", "d", "lu",
  // ...), to `out`. False (with `error` set) when it cannot.
  virtual bool Next(std::string_view conversion, Groundwork::SecureString* out,
                    std::string* error) = 0;
};

// Takes the arguments from a va_list (copied; the caller's list is untouched).
class VaListSource : public ValueSource {
 public:
  explicit VaListSource(va_list args) { va_copy(args_, args); }
  ~VaListSource() override { va_end(args_); }
  VaListSource(const VaListSource&) = delete;
  VaListSource& operator=(const VaListSource&) = delete;

  bool Next(std::string_view conversion, Groundwork::SecureString* out,
            std::string* error) override;

 private:
  va_list args_;
};

inline constexpr int kMaxListDepth = 8;

// Parses `text` as a list. On failure returns false with `error` naming the
// offset and what was expected (never the text of a value).
bool ParseItemList(std::string_view text, ValueSource* source, std::vector<TextItem>* out,
                   std::string* error);

}  // namespace Qlc
