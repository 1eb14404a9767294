#include "json_read.h"

#include <cmath>
#include <cstdlib>

namespace tool {

namespace {

class Parser {
 public:
  explicit Parser(const std::string& text) : s_(text) {}

  JsonValue Document() {
    if (s_.size() > kJsonMaxBytes) Fail("the text is larger than " + std::to_string(kJsonMaxBytes >> 20) + " MB");
    JsonValue v = Value(0);
    Blanks();
    if (at_ != s_.size()) Fail("text after the value");
    return v;
  }

 private:
  [[noreturn]] void Fail(const std::string& what) const {
    std::size_t line = 1, column = 1;
    for (std::size_t i = 0; i < at_ && i < s_.size(); ++i) {
      if (s_[i] == '\n') ++line, column = 1;
      else ++column;
    }
    throw JsonError("line " + std::to_string(line) + " column " + std::to_string(column) + ": " + what);
  }

  void Blanks() {
    while (at_ < s_.size() && (s_[at_] == ' ' || s_[at_] == '\t' || s_[at_] == '\n' || s_[at_] == '\r')) ++at_;
  }

  bool Take(char c) {
    Blanks();
    if (at_ < s_.size() && s_[at_] == c) {
      ++at_;
      return true;
    }
    return false;
  }

  void Expect(char c) {
    if (!Take(c)) Fail(std::string("expected '") + c + "'");
  }

  bool Word(const char* word) {
    std::size_t n = 0;
    while (word[n]) ++n;
    if (s_.compare(at_, n, word) != 0) return false;
    at_ += n;
    return true;
  }

  JsonValue Value(std::size_t depth) {
    if (depth >= kJsonMaxDepth) Fail("nested deeper than " + std::to_string(kJsonMaxDepth));
    Blanks();
    if (at_ >= s_.size()) Fail("unexpected end of text");
    JsonValue v;
    const char c = s_[at_];
    if (c == '{') {
      ++at_;
      v.kind = JsonValue::Kind::Object;
      if (Take('}')) return v;
      do {
        Blanks();
        if (at_ >= s_.size() || s_[at_] != '"') Fail("expected a key in quotes");
        const std::size_t keyAt = at_;
        std::string key = String();
        Expect(':');
        JsonValue member = Value(depth + 1);
        if (!v.members.emplace(std::move(key), std::move(member)).second) {
          at_ = keyAt;
          Fail("a key repeated");
        }
      } while (Take(','));
      Expect('}');
    } else if (c == '[') {
      ++at_;
      v.kind = JsonValue::Kind::Array;
      if (Take(']')) return v;
      do v.items.push_back(Value(depth + 1));
      while (Take(','));
      Expect(']');
    } else if (c == '"') {
      v.kind = JsonValue::Kind::String;
      v.text = String();
    } else if (Word("true")) {
      v.kind = JsonValue::Kind::Boolean;
      v.boolean = true;
    } else if (Word("false")) {
      v.kind = JsonValue::Kind::Boolean;
    } else if (Word("null")) {
    } else if (c == '-' || (c >= '0' && c <= '9')) {
      v.kind = JsonValue::Kind::Number;
      v.number = Number();
    } else {
      Fail("not a JSON value");
    }
    return v;
  }

  bool Digit() const { return at_ < s_.size() && s_[at_] >= '0' && s_[at_] <= '9'; }

  // JSON's own number grammar, checked before strtod reads it: strtod alone would take
  // "0x10", "inf" and "nan".
  double Number() {
    const std::size_t start = at_;
    if (s_[at_] == '-') ++at_;
    if (!Digit()) Fail("a digit must follow '-'");
    if (s_[at_] == '0') ++at_;
    else while (Digit()) ++at_;
    if (at_ < s_.size() && s_[at_] == '.') {
      ++at_;
      if (!Digit()) Fail("a digit must follow '.'");
      while (Digit()) ++at_;
    }
    if (at_ < s_.size() && (s_[at_] == 'e' || s_[at_] == 'E')) {
      ++at_;
      if (at_ < s_.size() && (s_[at_] == '+' || s_[at_] == '-')) ++at_;
      if (!Digit()) Fail("a digit must follow the exponent");
      while (Digit()) ++at_;
    }
    const std::string digits = s_.substr(start, at_ - start);
    const double value = std::strtod(digits.c_str(), nullptr);
    if (!std::isfinite(value)) {
      at_ = start;
      Fail("a number too large");
    }
    return value;
  }

  unsigned Hex4() {
    unsigned u = 0;
    for (int k = 0; k < 4; ++k, ++at_) {
      if (at_ >= s_.size()) Fail("unexpected end of text");
      const char h = s_[at_];
      u <<= 4;
      if (h >= '0' && h <= '9') u |= static_cast<unsigned>(h - '0');
      else if (h >= 'a' && h <= 'f') u |= static_cast<unsigned>(h - 'a' + 10);
      else if (h >= 'A' && h <= 'F') u |= static_cast<unsigned>(h - 'A' + 10);
      else Fail("\\u needs four hex digits");
    }
    return u;
  }

  static void Utf8(unsigned u, std::string& out) {
    if (u < 0x80) {
      out += static_cast<char>(u);
    } else if (u < 0x800) {
      out += static_cast<char>(0xC0 | (u >> 6));
      out += static_cast<char>(0x80 | (u & 0x3F));
    } else if (u < 0x10000) {
      out += static_cast<char>(0xE0 | (u >> 12));
      out += static_cast<char>(0x80 | ((u >> 6) & 0x3F));
      out += static_cast<char>(0x80 | (u & 0x3F));
    } else {
      out += static_cast<char>(0xF0 | (u >> 18));
      out += static_cast<char>(0x80 | ((u >> 12) & 0x3F));
      out += static_cast<char>(0x80 | ((u >> 6) & 0x3F));
      out += static_cast<char>(0x80 | (u & 0x3F));
    }
  }

  std::string String() {
    ++at_;  // the opening quote
    std::string out;
    for (;;) {
      if (at_ >= s_.size()) Fail("a string without its closing quote");
      const unsigned char c = static_cast<unsigned char>(s_[at_]);
      if (c == '"') {
        ++at_;
        return out;
      }
      if (c < 0x20) Fail("a control character inside a string");
      if (c != '\\') {
        out += static_cast<char>(c);
        ++at_;
        continue;
      }
      if (++at_ >= s_.size()) Fail("a string without its closing quote");
      const char e = s_[at_++];
      switch (e) {
        case '"': case '\\': case '/': out += e; break;
        case 'b': out += '\b'; break;
        case 'f': out += '\f'; break;
        case 'n': out += '\n'; break;
        case 'r': out += '\r'; break;
        case 't': out += '\t'; break;
        case 'u': {
          unsigned u = Hex4();
          // A high surrogate joins the low one after it; a lone half stands for U+FFFD.
          if (u >= 0xD800 && u < 0xDC00 && s_.compare(at_, 2, "\\u") == 0) {
            at_ += 2;
            const unsigned low = Hex4();
            u = low >= 0xDC00 && low < 0xE000 ? 0x10000 + ((u - 0xD800) << 10) + (low - 0xDC00) : 0xFFFD;
          } else if (u >= 0xD800 && u < 0xE000) {
            u = 0xFFFD;
          }
          Utf8(u, out);
          break;
        }
        default:
          --at_;
          Fail("an unknown escape in a string");
      }
    }
  }

  const std::string& s_;
  std::size_t at_ = 0;
};

}  // namespace

JsonValue ParseJson(const std::string& text) { return Parser(text).Document(); }

}  // namespace tool
