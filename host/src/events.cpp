// Events: a libffi closure per handler, which the plugin calls as a C function and
// which routes the call to the script's handler.
#include "runtime_impl.h"

namespace host {

namespace {

// Routes a libffi closure call to the script's handler.
void EventTrampoline(ffi_cif*, void* ret, void** args, void* user) {
  const std::shared_ptr<EventBinding> b = static_cast<EventBinding*>(user)->shared_from_this();
  Runtime::Impl& rt = *b->runtime;
  const Object self = Object::Retain(*static_cast<REALobject*>(args[0]));
  std::vector<Value> values;
  const auto& params = b->event->parsed.parameters;
  for (std::size_t i = 0; i < params.size(); ++i) {
    const void* arg = args[i + 1];
    if (params[i].byRef) arg = *static_cast<void* const*>(arg);
    switch (params[i].type.kind) {
      case TypeKind::Integer: values.emplace_back(*static_cast<const std::int32_t*>(arg)); break;
      case TypeKind::Double: values.emplace_back(*static_cast<const double*>(arg)); break;
      case TypeKind::Boolean: values.emplace_back(*static_cast<const std::uint8_t*>(arg) != 0); break;
      case TypeKind::Color: values.emplace_back(Color{*static_cast<const std::uint32_t*>(arg)}); break;
      case TypeKind::String: {
        auto s = *static_cast<REALstring const*>(arg);
        if (s && !rt.liveStrings.count(s)) rt.Fault("event argument string is not alive");
        values.emplace_back(s && rt.liveStrings.count(s) ? Runtime::Impl::StringText(s) : std::string());
        break;
      }
      case TypeKind::Object: values.emplace_back(Object::Retain(*static_cast<REALobject const*>(arg))); break;
    }
  }
  Value result;
  try {
    result = b->handler(self, values);
  } catch (const std::exception& e) {
    // An exception must not unwind through the plugin's C frames.
    rt.Fault(std::string("event handler threw: ") + e.what());
  }
  const auto& rtype = b->event->parsed.result;
  if (!rtype) return;
  // Results cross with the same ownership as a registered function's results.
  switch (rtype->kind) {
    case TypeKind::Integer: *static_cast<ffi_arg*>(ret) = static_cast<ffi_arg>(result.IsNil() ? 0 : result.AsInteger()); break;
    case TypeKind::Boolean: *static_cast<ffi_arg*>(ret) = result.IsBoolean() && result.AsBoolean(); break;
    case TypeKind::Color: *static_cast<ffi_arg*>(ret) = result.IsColor() ? result.AsColor().rgb : 0; break;
    case TypeKind::Double: *static_cast<double*>(ret) = result.IsNil() ? 0.0 : result.AsDouble(); break;
    case TypeKind::String: {
      const std::string text = result.IsString() ? result.AsString() : std::string();
      *static_cast<void**>(ret) = rt.BuildString(text.data(), text.size());
      break;
    }
    case TypeKind::Object: {
      REALobject o = result.IsObject() ? result.AsObject().get() : nullptr;
      rt.LockObject(o);
      *static_cast<void**>(ret) = o;
      break;
    }
  }
}

}  // namespace

void Runtime::SetEventHandler(const Object& self, const std::string& event, EventHandler handler) {
  ClassEntry& cls = impl_->ClassOf(self);
  std::size_t index = SIZE_MAX;
  for (std::size_t i = 0; i < cls.info.events.size(); ++i)
    if (EqualsIgnoreCase(cls.info.events[i].parsed.name, event)) index = i;
  if (index == SIZE_MAX) throw HostError("no event " + event + " in class " + cls.info.name);
  auto& bindings = impl_->Extras(self.get()).events;
  const intptr_t id = cls.eventIds[index];
  for (auto it = bindings.begin(); it != bindings.end(); ++it)
    if ((*it)->eventId == id) {
      bindings.erase(it);
      break;
    }
  if (!handler) return;
  auto b = std::make_shared<EventBinding>();
  b->runtime = impl_.get();
  b->object = self.get();
  b->eventId = id;
  b->event = &cls.info.events[index];
  b->handler = std::move(handler);
  if (!b->call.Prepare({&ffi_type_pointer}, b->event->parsed.parameters, b->event->parsed.result))
    throw HostError("cannot build a handler for " + b->event->declaration);
  b->closure = static_cast<ffi_closure*>(ffi_closure_alloc(sizeof(ffi_closure), &b->code));
  if (!b->closure) throw std::bad_alloc();
  if (ffi_prep_closure_loc(b->closure, &b->call.cif, &EventTrampoline, b.get(), b->code) != FFI_OK)
    throw HostError("cannot build a handler for " + b->event->declaration);
  bindings.push_back(std::move(b));
}

}  // namespace host
