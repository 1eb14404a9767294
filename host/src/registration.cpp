// Registration: class definitions and global methods become class entries with their
// libffi call interfaces prepared once.
#include "runtime_impl.h"

namespace host {

void Runtime::Impl::RegisterClass(REALclassDefinition* def) {
  if (!def || !def->name) return Fault("class definition without a name");
  if (def->version != REAL_PLUGIN_VERSION) {
    registrationErrors.push_back(std::string(def->name) + ": unsupported interface version " +
                                 std::to_string(def->version));
    return;
  }
  auto cls = std::make_unique<ClassEntry>();
  cls->definition = def;
  cls->info.name = def->name;
  cls->info.dataSize = static_cast<std::size_t>(def->dataSize > 0 ? def->dataSize : 0);
  cls->constructor = def->constructor;
  cls->destructor = def->destructor;
  for (intptr_t i = 0; i < def->propertyCount; ++i) {
    const REALproperty& p = def->properties[i];
    auto type = p.type ? ParseTypeName(p.type) : std::nullopt;
    if (!p.name || !type || !p.getter) {
      registrationErrors.push_back(cls->info.name + ": malformed property " +
                                   (p.name ? p.name : "(unnamed)"));
      continue;
    }
    cls->info.properties.push_back({p.name, *type, p.setter == nullptr});
    cls->getters.push_back(p.getter);
    cls->setters.push_back(p.setter);
    cls->propertyParams.push_back(p.param);
    auto get = std::make_unique<CallInterface>();
    get->Prepare({&ffi_type_pointer, IntPtrType()}, {}, *type);
    auto set = std::make_unique<CallInterface>();
    set->Prepare({&ffi_type_pointer, IntPtrType()}, {Parameter{"value", *type, false}}, std::nullopt);
    cls->getterCalls.push_back(std::move(get));
    cls->setterCalls.push_back(std::move(set));
  }
  for (intptr_t i = 0; i < def->methodCount; ++i) {
    const REALmethodDefinition& m = def->methods[i];
    std::string error;
    auto parsed = m.declaration ? ParseDeclaration(m.declaration, &error) : std::nullopt;
    if (!parsed || !m.function) {
      registrationErrors.push_back(cls->info.name + ": " +
                                   (m.declaration ? error : std::string("method without a declaration")));
      continue;
    }
    auto call = std::make_unique<CallInterface>();
    if (!call->Prepare({&ffi_type_pointer}, parsed->parameters, parsed->result)) {
      registrationErrors.push_back(cls->info.name + ": cannot call " + m.declaration);
      continue;
    }
    cls->info.methods.push_back({m.declaration, std::move(*parsed), m.function});
    cls->methodCalls.push_back(std::move(call));
  }
  for (intptr_t i = 0; i < def->eventCount; ++i) {
    REALevent& e = def->events[i];
    std::string error;
    auto parsed = e.declaration ? ParseDeclaration(e.declaration, &error) : std::nullopt;
    if (!parsed) {
      registrationErrors.push_back(cls->info.name + ": " + error);
      continue;
    }
    cls->info.events.push_back({e.declaration, std::move(*parsed)});
    events.emplace_back(cls.get(), cls->info.events.size() - 1);
    e.forSystemUse = static_cast<intptr_t>(events.size());
    cls->eventIds.push_back(e.forSystemUse);
  }
  def->forSystemUse = static_cast<intptr_t>(kDataOffset);
  classes.push_back(std::move(cls));
}

void Runtime::Impl::RegisterMethod(REALmethodDefinition* m) {
  if (!m || !m->declaration || !m->function) {
    registrationErrors.push_back("global method without a declaration or function");
    return;
  }
  std::string error;
  auto parsed = ParseDeclaration(m->declaration, &error);
  if (!parsed) {
    registrationErrors.push_back(error);
    return;
  }
  auto call = std::make_unique<CallInterface>();
  if (!call->Prepare({}, parsed->parameters, parsed->result)) {
    registrationErrors.push_back(std::string("cannot call ") + m->declaration);
    return;
  }
  globals.push_back({m->declaration, std::move(*parsed), m->function});
  globalCalls.push_back(std::move(call));
}

}  // namespace host
