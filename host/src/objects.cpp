// Host objects and strings: their reference counts, the live sets that count them,
// and the references the C++ API's Object handle holds.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>

#include "runtime_impl.h"
#include "runtime_internal.h"

namespace host {

Runtime::Impl* g_active = nullptr;

Runtime::Impl& Active() {
  if (!g_active) {
    std::fprintf(stderr, "host: entry called with no runtime alive\n");
    std::abort();
  }
  return *g_active;
}

void Runtime::Impl::Fault(std::string text) {
  std::fprintf(stderr, "host: %s\n", text.c_str());
  faults.push_back(std::move(text));
}

REALstring Runtime::Impl::BuildString(const char* text, std::size_t length) {
  auto* record = new REALstringRecord{};
  char* buffer = static_cast<char*>(std::malloc(length + 2));
  if (!buffer) throw std::bad_alloc();
  buffer[0] = static_cast<char>(length < 255 ? length : 255);
  if (length) std::memcpy(buffer + 1, text, length);
  buffer[length + 1] = '\0';
  record->hostWord0 = 1;  // reference count
  record->buffer = buffer;
  record->length = static_cast<intptr_t>(length);
  liveStrings.insert(record);
  return record;
}

void Runtime::Impl::LockString(REALstring s) {
  if (!s) return;
  if (!liveStrings.count(s)) return Fault("lock of a string that is not alive");
  ++s->hostWord0;
}

void Runtime::Impl::UnlockString(REALstring s) {
  if (!s) return;
  if (!liveStrings.count(s)) return Fault("unlock of a string that is not alive");
  if (--s->hostWord0 > 0) return;
  liveStrings.erase(s);
  std::free(const_cast<char*>(s->buffer));
  delete s;
}

std::string Runtime::Impl::StringText(REALstring s) {
  if (!s || !s->buffer) return {};
  return std::string(s->buffer + 1, static_cast<std::size_t>(s->length));
}

REALobject Runtime::Impl::NewObject(ClassEntry* cls) {
  const std::size_t size = kDataOffset + cls->info.dataSize;
  void* memory = std::calloc(1, size);
  if (!memory) throw std::bad_alloc();
  auto* object = static_cast<REALobject>(memory);
  object->refs = 1;
  object->cls = cls;
  object->extras = nullptr;
  liveObjects.insert(object);
  if (cls->constructor) reinterpret_cast<void (*)(REALobject)>(cls->constructor)(object);
  return object;
}

void Runtime::Impl::LockObject(REALobject o) {
  if (!o) return;
  if (!liveObjects.count(o)) return Fault("lock of an object that is not alive");
  ++o->refs;
}

void Runtime::Impl::UnlockObject(REALobject o) {
  if (!o) return;
  if (!liveObjects.count(o)) return Fault("unlock of an object that is not alive");
  if (--o->refs > 0) return;
  if (o->cls->destructor) reinterpret_cast<void (*)(REALobject)>(o->cls->destructor)(o);
  if (o->refs != 0) return Fault("object of class " + o->cls->info.name + " revived by its destructor");
  liveObjects.erase(o);
  if (o->extras && (o->extras->picture || o->extras->graphics)) ReleasePicture(o);
  delete o->extras;
  std::free(o);
}

host_ObjectExtras& Runtime::Impl::Extras(REALobject o) {
  if (!o->extras) o->extras = new host_ObjectExtras;
  return *o->extras;
}

ClassEntry* Runtime::Impl::FindClass(const std::string& name) {
  for (auto& c : classes)
    if (EqualsIgnoreCase(c->info.name, name)) return c.get();
  if (EqualsIgnoreCase(name, folderItemClass->info.name)) return folderItemClass.get();
  return nullptr;
}

REALobject Runtime::Impl::NewFolderItem(const std::string& windowsPath) {
  REALobject item = NewObject(folderItemClass.get());
  Extras(item).folderPath = windowsPath;
  return item;
}

bool Runtime::Impl::IsA(REALobject o, const ClassEntry* cls) const {
  return o && liveObjects.count(o) && o->cls == cls;
}

namespace internal {
void LockObject(REALobject object) { Active().LockObject(object); }
void UnlockObject(REALobject object) {
  // Objects may be released after their runtime is gone only by mistake; say so.
  if (!g_active) {
    std::fprintf(stderr, "host: object released after its runtime ended\n");
    return;
  }
  g_active->UnlockObject(object);
}
std::string ClassNameOf(REALobject object) { return object->cls->info.name; }
}  // namespace internal

}  // namespace host
