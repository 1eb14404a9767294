// Parsing of the declarations a plugin registers: "Get(index as Integer) as Double",
// "getxyz(byref x as double, ...)", "DebugString(aString as string)".
#ifndef TINTWELL_HOST_DECLARATION_H
#define TINTWELL_HOST_DECLARATION_H

#include <optional>
#include <string>
#include <vector>

namespace host {

enum class TypeKind { Integer, Double, Boolean, Color, String, Object };

struct Type {
  TypeKind kind = TypeKind::Integer;
  std::string className;  // for Object: the class as written ("Folderitem", "Clut", ...)
};

struct Parameter {
  std::string name;
  Type type;
  bool byRef = false;
};

struct Declaration {
  std::string name;
  std::vector<Parameter> parameters;
  std::optional<Type> result;
};

// The type a type name stands for; names match without regard to case. Any other
// identifier names a class.
std::optional<Type> ParseTypeName(const std::string& text);

// Parses a declaration, or returns nothing and describes the fault in *error.
std::optional<Declaration> ParseDeclaration(const std::string& text, std::string* error);

// "Integer", "Double", ..., or the class name.
std::string TypeName(const Type& type);

bool EqualsIgnoreCase(const std::string& a, const std::string& b);

}  // namespace host

#endif
