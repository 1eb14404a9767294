#include "host/declaration.h"

#include <cctype>

namespace host {

bool EqualsIgnoreCase(const std::string& a, const std::string& b) {
  if (a.size() != b.size()) return false;
  for (std::size_t i = 0; i < a.size(); ++i)
    if (std::tolower(static_cast<unsigned char>(a[i])) != std::tolower(static_cast<unsigned char>(b[i])))
      return false;
  return true;
}

namespace {

bool IsIdentStart(char c) { return std::isalpha(static_cast<unsigned char>(c)) || c == '_'; }
bool IsIdentChar(char c) { return std::isalnum(static_cast<unsigned char>(c)) || c == '_'; }

// A small cursor over the declaration text.
class Scanner {
 public:
  explicit Scanner(const std::string& text) : text_(text) {}

  void SkipSpace() {
    while (pos_ < text_.size() && std::isspace(static_cast<unsigned char>(text_[pos_]))) ++pos_;
  }
  bool AtEnd() {
    SkipSpace();
    return pos_ >= text_.size();
  }
  bool Accept(char c) {
    SkipSpace();
    if (pos_ < text_.size() && text_[pos_] == c) {
      ++pos_;
      return true;
    }
    return false;
  }
  std::optional<std::string> Identifier() {
    SkipSpace();
    if (pos_ >= text_.size() || !IsIdentStart(text_[pos_])) return std::nullopt;
    const std::size_t start = pos_;
    while (pos_ < text_.size() && IsIdentChar(text_[pos_])) ++pos_;
    return text_.substr(start, pos_ - start);
  }
  // Accepts a keyword only when a whole identifier equal to it follows.
  bool AcceptKeyword(const char* keyword) {
    const std::size_t saved = pos_;
    auto word = Identifier();
    if (word && EqualsIgnoreCase(*word, keyword)) return true;
    pos_ = saved;
    return false;
  }
  std::size_t Position() const { return pos_; }

 private:
  const std::string& text_;
  std::size_t pos_ = 0;
};

bool Fail(std::string* error, const std::string& text, std::size_t pos, const char* what) {
  if (error) *error = std::string(what) + " at column " + std::to_string(pos + 1) + " of \"" + text + "\"";
  return false;
}

}  // namespace

std::optional<Type> ParseTypeName(const std::string& text) {
  if (text.empty() || !IsIdentStart(text[0])) return std::nullopt;
  for (char c : text)
    if (!IsIdentChar(c)) return std::nullopt;
  static const struct {
    const char* name;
    TypeKind kind;
  } kPrimitives[] = {{"Integer", TypeKind::Integer}, {"Double", TypeKind::Double},
                     {"Boolean", TypeKind::Boolean}, {"Color", TypeKind::Color},
                     {"String", TypeKind::String}};
  for (const auto& p : kPrimitives)
    if (EqualsIgnoreCase(text, p.name)) return Type{p.kind, {}};
  return Type{TypeKind::Object, text};
}

std::string TypeName(const Type& type) {
  switch (type.kind) {
    case TypeKind::Integer: return "Integer";
    case TypeKind::Double: return "Double";
    case TypeKind::Boolean: return "Boolean";
    case TypeKind::Color: return "Color";
    case TypeKind::String: return "String";
    case TypeKind::Object: return type.className;
  }
  return "?";
}

std::optional<Declaration> ParseDeclaration(const std::string& text, std::string* error) {
  Scanner in(text);
  Declaration decl;
  auto name = in.Identifier();
  if (!name) return Fail(error, text, in.Position(), "expected a name"), std::nullopt;
  decl.name = *name;
  if (!in.Accept('(')) return Fail(error, text, in.Position(), "expected '('"), std::nullopt;
  if (!in.Accept(')')) {
    do {
      Parameter param;
      if (in.AcceptKeyword("byref"))
        param.byRef = true;
      else
        in.AcceptKeyword("byval");
      auto pname = in.Identifier();
      if (!pname || EqualsIgnoreCase(*pname, "as"))
        return Fail(error, text, in.Position(), "expected a parameter name"), std::nullopt;
      param.name = *pname;
      if (!in.AcceptKeyword("as")) return Fail(error, text, in.Position(), "expected 'as'"), std::nullopt;
      auto tname = in.Identifier();
      if (!tname) return Fail(error, text, in.Position(), "expected a type"), std::nullopt;
      param.type = *ParseTypeName(*tname);
      decl.parameters.push_back(std::move(param));
    } while (in.Accept(','));
    if (!in.Accept(')')) return Fail(error, text, in.Position(), "expected ',' or ')'"), std::nullopt;
  }
  if (in.AcceptKeyword("as")) {
    auto tname = in.Identifier();
    if (!tname) return Fail(error, text, in.Position(), "expected a result type"), std::nullopt;
    decl.result = *ParseTypeName(*tname);
  }
  if (!in.AtEnd()) return Fail(error, text, in.Position(), "unexpected text"), std::nullopt;
  return decl;
}

}  // namespace host
