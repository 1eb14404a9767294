// Loading the plugin, and the members of the C++ API that belong to no other concern:
// the withheld entries, folder items and what the plugin registered.
#include "host/runtime.h"

#include <dlfcn.h>

#include <cstdio>

#include "runtime_impl.h"
#include "win32_paths.h"

namespace host {

Runtime::Runtime(const std::string& pluginPath, Options options) : impl_(std::make_unique<Impl>()) {
  if (g_active) throw HostError("another runtime is alive");
  impl_->withheld.insert(options.withheld.begin(), options.withheld.end());
  impl_->folderItemClass = std::make_unique<ClassEntry>();
  impl_->folderItemClass->info.name = "FolderItem";
  impl_->pictureClass = std::make_unique<ClassEntry>();
  impl_->pictureClass->info.name = "Picture";
  impl_->graphicsClass = std::make_unique<ClassEntry>();
  impl_->graphicsClass->info.name = "Graphics";

  // An empty path loads the running program itself, for tests that link a plugin in.
  impl_->library = dlopen(pluginPath.empty() ? nullptr : pluginPath.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!impl_->library) {
    const char* why = dlerror();
    throw HostError("cannot load plugin " + pluginPath + ": " + (why ? why : "unknown error"));
  }
  auto main = reinterpret_cast<REALPluginMainProc>(dlsym(impl_->library, "REALPluginMain"));
  if (!main) {
    dlclose(impl_->library);
    throw HostError("plugin " + pluginPath + " exports no REALPluginMain");
  }
  g_active = impl_.get();
  main(&ResolveEntry);
  for (const std::string& e : impl_->registrationErrors) std::fprintf(stderr, "host: registration: %s\n", e.c_str());
}

Runtime::~Runtime() {
  if (!impl_->liveObjects.empty() || !impl_->liveStrings.empty())
    std::fprintf(stderr, "host: unloading with %zu objects and %zu strings alive\n", impl_->liveObjects.size(),
                 impl_->liveStrings.size());
  // Objects still alive would call into the unloaded plugin: keep the library then.
  if (impl_->liveObjects.empty()) dlclose(impl_->library);
  g_active = nullptr;
}

void Runtime::SetWithheld(const std::string& entry, bool withheld) {
  if (withheld)
    impl_->withheld.insert(entry);
  else
    impl_->withheld.erase(entry);
}

Object Runtime::MakeFolderItem(const std::string& posixPath) {
  const auto windows = win32::ExactWindowsPathFromPosix(posixPath);
  if (!windows) throw HostError("a Windows path cannot name " + posixPath + " (a backslash in a name)");
  return Object::Adopt(impl_->NewFolderItem(*windows));
}

std::string Runtime::FolderItemPath(const Object& item) const {
  if (!item || item.get()->cls != impl_->folderItemClass.get()) throw HostError("not a folder item");
  return impl_->Extras(item.get()).folderPath;
}

int Runtime::pluginVersion() const { return impl_->pluginVersion; }

std::vector<const ClassInfo*> Runtime::Classes() const {
  std::vector<const ClassInfo*> list;
  for (const auto& c : impl_->classes) list.push_back(&c->info);
  return list;
}

std::vector<const MethodInfo*> Runtime::Globals() const {
  std::vector<const MethodInfo*> list;
  for (const auto& m : impl_->globals) list.push_back(&m);
  return list;
}

const std::vector<std::string>& Runtime::RegistrationErrors() const { return impl_->registrationErrors; }
const std::vector<std::string>& Runtime::ResolvedEntries() const { return impl_->resolved; }
std::size_t Runtime::LiveObjects() const { return impl_->liveObjects.size(); }
std::size_t Runtime::LiveStrings() const { return impl_->liveStrings.size(); }
const std::vector<std::string>& Runtime::Faults() const { return impl_->faults; }
std::size_t Runtime::EventLookups() const { return impl_->eventLookups; }

}  // namespace host
