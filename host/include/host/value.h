// Values of the host's types as the C++ API hands them to and from the plugin.
#ifndef TINTWELL_HOST_VALUE_H
#define TINTWELL_HOST_VALUE_H

#include <cstdint>
#include <string>
#include <utility>
#include <variant>

#include "plugin_records.h"

namespace host {

class Runtime;

// One counted reference to a host object; copying takes another reference. Must not
// outlive the Runtime that made the object.
class Object {
 public:
  Object() = default;
  Object(const Object& other);
  Object(Object&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
  Object& operator=(Object other) noexcept {
    std::swap(object_, other.object_);
    return *this;
  }
  ~Object();

  // Takes over a reference the caller owns.
  static Object Adopt(REALobject object) { return Object(object); }
  // Takes a new reference to a borrowed object.
  static Object Retain(REALobject object);

  REALobject get() const { return object_; }
  explicit operator bool() const { return object_ != nullptr; }
  // The registered class name ("FolderItem" for the host's folder items).
  std::string ClassName() const;
  bool operator==(const Object& other) const { return object_ == other.object_; }

 private:
  explicit Object(REALobject object) : object_(object) {}
  REALobject object_ = nullptr;
};

struct Color {
  std::uint32_t rgb = 0;  // &h00RRGGBB
  bool operator==(const Color& other) const { return rgb == other.rgb; }
};

struct Nil {
  bool operator==(const Nil&) const { return true; }
};

// Integer, Double, Boolean, Color, String (bytes, zeros allowed), an object, or nil.
class Value {
 public:
  Value() = default;
  Value(std::nullptr_t) {}
  Value(int v) : v_(static_cast<std::int32_t>(v)) {}
  Value(double v) : v_(v) {}
  Value(bool v) : v_(v) {}
  Value(Color v) : v_(v) {}
  Value(std::string v) : v_(std::move(v)) {}
  Value(const char* v) : v_(std::string(v)) {}
  Value(Object v) {
    if (v) v_ = std::move(v);
  }

  bool IsNil() const { return std::holds_alternative<Nil>(v_); }
  bool IsInteger() const { return std::holds_alternative<std::int32_t>(v_); }
  bool IsDouble() const { return std::holds_alternative<double>(v_); }
  bool IsBoolean() const { return std::holds_alternative<bool>(v_); }
  bool IsColor() const { return std::holds_alternative<Color>(v_); }
  bool IsString() const { return std::holds_alternative<std::string>(v_); }
  bool IsObject() const { return std::holds_alternative<Object>(v_); }

  // Typed reads; a read of the wrong kind throws host::HostError.
  std::int32_t AsInteger() const;
  double AsDouble() const;  // an Integer reads as its Double value
  bool AsBoolean() const;
  Color AsColor() const;
  const std::string& AsString() const;
  const Object& AsObject() const;

  // "Integer 5", "String \"abc\"", "nil", ... for messages.
  std::string Describe() const;

 private:
  std::variant<Nil, std::int32_t, double, bool, Color, std::string, Object> v_;
};

// An argument: a value, or a caller's variable passed ByRef (written back after the call).
class Arg {
 public:
  template <class T, class = std::enable_if_t<std::is_constructible_v<Value, T>>>
  Arg(T&& value) : value_(std::forward<T>(value)) {}
  static Arg Ref(Value& variable) {
    Arg a(Nil{});
    a.ref_ = &variable;
    return a;
  }
  bool IsRef() const { return ref_ != nullptr; }
  const Value& value() const { return ref_ ? *ref_ : value_; }
  Value* ref() const { return ref_; }

 private:
  explicit Arg(Nil) {}
  Value value_;
  Value* ref_ = nullptr;
};

inline Arg ByRef(Value& variable) { return Arg::Ref(variable); }

}  // namespace host

#endif
