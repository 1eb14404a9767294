#include "host/value.h"

#include "host/runtime.h"
#include "runtime_internal.h"

namespace host {

Object::Object(const Object& other) : object_(other.object_) {
  if (object_) internal::LockObject(object_);
}

Object::~Object() {
  if (object_) internal::UnlockObject(object_);
}

Object Object::Retain(REALobject object) {
  if (object) internal::LockObject(object);
  return Object(object);
}

std::string Object::ClassName() const { return object_ ? internal::ClassNameOf(object_) : "nil"; }

namespace {
[[noreturn]] void WrongKind(const Value& v, const char* wanted) {
  throw HostError("expected " + std::string(wanted) + ", got " + v.Describe());
}
}  // namespace

std::int32_t Value::AsInteger() const {
  if (auto p = std::get_if<std::int32_t>(&v_)) return *p;
  WrongKind(*this, "an Integer");
}
double Value::AsDouble() const {
  if (auto p = std::get_if<double>(&v_)) return *p;
  if (auto p = std::get_if<std::int32_t>(&v_)) return *p;
  WrongKind(*this, "a Double");
}
bool Value::AsBoolean() const {
  if (auto p = std::get_if<bool>(&v_)) return *p;
  WrongKind(*this, "a Boolean");
}
Color Value::AsColor() const {
  if (auto p = std::get_if<Color>(&v_)) return *p;
  WrongKind(*this, "a Color");
}
const std::string& Value::AsString() const {
  if (auto p = std::get_if<std::string>(&v_)) return *p;
  WrongKind(*this, "a String");
}
const Object& Value::AsObject() const {
  if (auto p = std::get_if<Object>(&v_)) return *p;
  WrongKind(*this, "an object");
}

std::string Value::Describe() const {
  struct {
    std::string operator()(const Nil&) const { return "nil"; }
    std::string operator()(std::int32_t v) const { return "Integer " + std::to_string(v); }
    std::string operator()(double v) const { return "Double " + std::to_string(v); }
    std::string operator()(bool v) const { return v ? "Boolean true" : "Boolean false"; }
    std::string operator()(Color v) const { return "Color " + std::to_string(v.rgb); }
    std::string operator()(const std::string& v) const { return "String \"" + v + "\""; }
    std::string operator()(const Object& v) const { return "object of class " + v.ClassName(); }
  } describe;
  return std::visit(describe, v_);
}

}  // namespace host
