// Calls into the plugin: choosing the overload that fits the arguments, laying the
// arguments out for libffi, and taking over what the callee hands back.
#include "runtime_impl.h"

namespace host {

ffi_type* FfiType(const Type& type) {
  switch (type.kind) {
    case TypeKind::Integer: return &ffi_type_sint32;
    case TypeKind::Double: return &ffi_type_double;
    case TypeKind::Boolean: return &ffi_type_uint8;
    case TypeKind::Color: return &ffi_type_uint32;
    case TypeKind::String:
    case TypeKind::Object: return &ffi_type_pointer;
  }
  return &ffi_type_void;
}

bool CallInterface::Prepare(const std::vector<ffi_type*>& leading, const std::vector<Parameter>& params,
                            const std::optional<Type>& result) {
  argTypes = leading;
  for (const Parameter& p : params) argTypes.push_back(p.byRef ? &ffi_type_pointer : FfiType(p.type));
  ffi_type* rtype = result ? FfiType(*result) : &ffi_type_void;
  return ffi_prep_cif(&cif, FFI_DEFAULT_ABI, static_cast<unsigned>(argTypes.size()), rtype,
                      argTypes.empty() ? nullptr : argTypes.data()) == FFI_OK;
}

// How well a value fits a parameter type: 0 not at all, higher is closer.
int Runtime::Impl::Fit(const Type& type, const Value& v) {
  switch (type.kind) {
    case TypeKind::Integer: return v.IsInteger() ? 3 : 0;
    case TypeKind::Double: return v.IsDouble() ? 3 : v.IsInteger() ? 2 : 0;
    case TypeKind::Boolean: return v.IsBoolean() ? 3 : 0;
    case TypeKind::Color: return v.IsColor() ? 3 : v.IsInteger() ? 1 : 0;
    case TypeKind::String: return v.IsString() ? 3 : 0;
    case TypeKind::Object:
      if (v.IsNil()) return 2;
      if (!v.IsObject()) return 0;
      return EqualsIgnoreCase(v.AsObject().get()->cls->info.name, type.className) ? 3 : 0;
  }
  return 0;
}

int Runtime::Impl::FitAll(const Declaration& d, const std::vector<Arg>& args) {
  if (d.parameters.size() != args.size()) return -1;
  int score = 0;
  for (std::size_t i = 0; i < args.size(); ++i) {
    const Parameter& p = d.parameters[i];
    if (p.byRef && !args[i].IsRef()) return -1;
    const int f = Fit(p.type, args[i].value());
    if (f == 0 && !(p.byRef && args[i].value().IsNil())) return -1;
    score += f;
  }
  return score;
}

// The best-fitting overload among methods named name, or throws.
template <class Info>
std::size_t Runtime::Impl::Choose(const std::vector<Info>& methods, const std::string& name, const std::vector<Arg>& args,
                   const std::string& where) {
  std::size_t best = SIZE_MAX;
  int bestScore = -1;
  bool named = false;
  for (std::size_t i = 0; i < methods.size(); ++i) {
    if (!EqualsIgnoreCase(methods[i].parsed.name, name)) continue;
    named = true;
    const int score = FitAll(methods[i].parsed, args);
    if (score > bestScore) bestScore = score, best = i;
  }
  if (!named) throw HostError("no method " + name + " in " + where);
  if (best == SIZE_MAX) {
    std::string text = "no overload of " + name + " in " + where + " takes (";
    for (std::size_t i = 0; i < args.size(); ++i)
      text += (i ? ", " : "") + std::string(args[i].IsRef() ? "ByRef " : "") + args[i].value().Describe();
    text += "); declared:";
    for (const auto& m : methods)
      if (EqualsIgnoreCase(m.parsed.name, name)) text += " \"" + m.declaration + "\"";
    throw HostError(text);
  }
  return best;
}

void Runtime::Impl::Store(Slot& s, const Type& type, const Value& value) {
  switch (type.kind) {
    case TypeKind::Integer: s.v.i = value.IsNil() ? 0 : value.AsInteger(); break;
    case TypeKind::Double: s.v.d = value.IsNil() ? 0.0 : value.AsDouble(); break;
    case TypeKind::Boolean: s.v.b = value.IsNil() ? 0 : value.AsBoolean() ? 1 : 0; break;
    case TypeKind::Color:
      s.v.c = value.IsNil() ? 0 : value.IsColor() ? value.AsColor().rgb : static_cast<std::uint32_t>(value.AsInteger());
      break;
    case TypeKind::String:
      if (value.IsString()) {
        const std::string& text = value.AsString();
        s.ownedString = BuildString(text.data(), text.size());
      }
      s.v.p = s.ownedString;
      break;
    case TypeKind::Object: s.v.p = value.IsObject() ? value.AsObject().get() : nullptr; break;
  }
}

// Turns a value the callee handed over (a result, or a ByRef variable's final
// content) into a Value, taking over its reference.
Value Runtime::Impl::TakeOver(const Type& type, const void* storage) {
  switch (type.kind) {
    case TypeKind::Integer: return Value(*static_cast<const std::int32_t*>(storage));
    case TypeKind::Double: return Value(*static_cast<const double*>(storage));
    case TypeKind::Boolean: return Value(*static_cast<const std::uint8_t*>(storage) != 0);
    case TypeKind::Color: return Value(Color{*static_cast<const std::uint32_t*>(storage)});
    case TypeKind::String: {
      auto s = *static_cast<REALstring const*>(storage);
      if (s && !liveStrings.count(s)) {
        Fault("a string handed to the host is not alive");
        return Value(std::string());
      }
      Value text(StringText(s));
      UnlockString(s);
      return text;
    }
    case TypeKind::Object: {
      auto o = *static_cast<REALobject const*>(storage);
      if (o && !liveObjects.count(o)) {
        Fault("an object handed to the host is not alive");
        return Value();
      }
      return Value(Object::Adopt(o));
    }
  }
  return Value();
}

// Calls fn through call with leading words, then the declared arguments.
Value Runtime::Impl::Invoke(CallInterface& call, REALproc fn, const std::vector<void*>& leading,
             const std::vector<Parameter>& params, const std::optional<Type>& result,
             const std::vector<Arg>& args) {
  std::vector<Slot> slots(params.size());
  std::vector<void*> values;
  std::vector<void*> leadingCopy = leading;
  for (auto& w : leadingCopy) values.push_back(&w);
  for (std::size_t i = 0; i < params.size(); ++i) {
    Slot& s = slots[i];
    Store(s, params[i].type, args[i].value());
    if (params[i].byRef) {
      // The variable owns its string and object references during the call.
      if (params[i].type.kind == TypeKind::Object) LockObject(static_cast<REALobject>(s.v.p));
      s.ownedString = nullptr;
      s.address = &s.v;
      values.push_back(&s.address);
    } else {
      values.push_back(&s.v);
    }
  }
  union {
    ffi_arg integral;
    double d;
    void* p;
  } ret{};
  ffi_call(&call.cif, FFI_FN(fn), &ret, values.empty() ? nullptr : values.data());

  for (std::size_t i = 0; i < params.size(); ++i) {
    if (params[i].byRef) {
      *args[i].ref() = TakeOver(params[i].type, &slots[i].v);
    } else if (slots[i].ownedString) {
      UnlockString(slots[i].ownedString);
    }
  }
  if (!result) return Value();
  switch (result->kind) {
    case TypeKind::Integer: {
      const auto v = static_cast<std::int32_t>(ret.integral);
      return TakeOver(*result, &v);
    }
    case TypeKind::Boolean: {
      const auto v = static_cast<std::uint8_t>(ret.integral);
      return TakeOver(*result, &v);
    }
    case TypeKind::Color: {
      const auto v = static_cast<std::uint32_t>(ret.integral);
      return TakeOver(*result, &v);
    }
    case TypeKind::Double: return TakeOver(*result, &ret.d);
    default: return TakeOver(*result, &ret.p);
  }
}

ClassEntry& Runtime::Impl::ClassOf(const Object& self) {
  if (!self) throw HostError("nil object");
  return *self.get()->cls;
}

std::size_t Runtime::Impl::FindProperty(ClassEntry& cls, const std::string& name) {
  for (std::size_t i = 0; i < cls.info.properties.size(); ++i)
    if (EqualsIgnoreCase(cls.info.properties[i].name, name)) return i;
  throw HostError("no property " + name + " in class " + cls.info.name);
}

Object Runtime::New(const std::string& className, std::initializer_list<Arg> args) {
  ClassEntry* cls = impl_->FindClass(className);
  if (!cls || !cls->definition) throw HostError("no class " + className);
  const std::vector<Arg> list(args);
  bool hasConstructors = false;
  for (const auto& m : cls->info.methods)
    if (EqualsIgnoreCase(m.parsed.name, cls->info.name)) hasConstructors = true;
  std::size_t chosen = SIZE_MAX;
  if (hasConstructors || !list.empty())
    chosen = impl_->Choose(cls->info.methods, cls->info.name, list, "class " + cls->info.name);
  Object self = Object::Adopt(impl_->NewObject(cls));
  if (chosen != SIZE_MAX) {
    const MethodInfo& m = cls->info.methods[chosen];
    impl_->Invoke(*cls->methodCalls[chosen], m.function, {self.get()}, m.parsed.parameters, m.parsed.result, list);
  }
  return self;
}

Value Runtime::Call(const Object& self, const std::string& method, std::initializer_list<Arg> args) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::vector<Arg> list(args);
  const std::size_t i = impl_->Choose(cls.info.methods, method, list, "class " + cls.info.name);
  const MethodInfo& m = cls.info.methods[i];
  return impl_->Invoke(*cls.methodCalls[i], m.function, {self.get()}, m.parsed.parameters, m.parsed.result, list);
}

Value Runtime::CallGlobal(const std::string& method, std::initializer_list<Arg> args) {
  const std::vector<Arg> list(args);
  const std::size_t i = impl_->Choose(impl_->globals, method, list, "the global methods");
  const MethodInfo& m = impl_->globals[i];
  return impl_->Invoke(*impl_->globalCalls[i], m.function, {}, m.parsed.parameters, m.parsed.result, list);
}

Value Runtime::Get(const Object& self, const std::string& property) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::size_t i = impl_->FindProperty(cls, property);
  return impl_->Invoke(*cls.getterCalls[i], cls.getters[i],
                       {self.get(), reinterpret_cast<void*>(cls.propertyParams[i])}, {},
                       cls.info.properties[i].type, {});
}

void Runtime::Set(const Object& self, const std::string& property, const Value& value) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::size_t i = impl_->FindProperty(cls, property);
  const PropertyInfo& p = cls.info.properties[i];
  if (p.readOnly) throw HostError("property " + p.name + " of class " + cls.info.name + " is read-only");
  if (impl_->Fit(p.type, value) == 0)
    throw HostError("property " + p.name + " is " + TypeName(p.type) + ", not " + value.Describe());
  impl_->Invoke(*cls.setterCalls[i], cls.setters[i], {self.get(), reinterpret_cast<void*>(cls.propertyParams[i])},
                {Parameter{"value", p.type, false}}, std::nullopt, {Arg(value)});
}

}  // namespace host
