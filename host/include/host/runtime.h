// The stand-in host runtime: loads a plugin with dlopen, answers the host entries it
// resolves, keeps reference-counted objects and strings, and calls the registered
// functions from their declarations through libffi.
//
// The ownership rules between host and plugin are written in plugin_records.h. In this
// C++ API: host::Object holds one reference; strings cross as std::string (the host
// builds a string for each argument and releases it after the call, and takes over and
// releases each string result); event handlers receive borrowed arguments as Values.
#ifndef TINTWELL_HOST_RUNTIME_H
#define TINTWELL_HOST_RUNTIME_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "host/declaration.h"
#include "host/value.h"
#include "plugin_records.h"

namespace host {

// Unknown names, wrong argument counts or types, and registration faults.
class HostError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// A script's handler for one event of one object: (the object, the event's arguments)
// → the event's result (ignored for events without one).
using EventHandler = std::function<Value(const Object& self, const std::vector<Value>& args)>;

struct MethodInfo {
  std::string declaration;  // as registered
  Declaration parsed;
  REALproc function = nullptr;
};

struct PropertyInfo {
  std::string name;
  Type type;
  bool readOnly = false;
};

struct EventInfo {
  std::string declaration;
  Declaration parsed;
};

struct ClassInfo {
  std::string name;
  std::size_t dataSize = 0;
  std::vector<PropertyInfo> properties;
  std::vector<MethodInfo> methods;
  std::vector<EventInfo> events;
};

class Runtime {
 public:
  struct Options {
    // Entries the resolver answers with null, as a host lacking them would.
    std::vector<std::string> withheld;
  };

  // Loads the plugin and calls its REALPluginMain. One Runtime may be alive at a time,
  // since a plugin's resolver carries no context. Unloads the plugin on destruction;
  // every Object must be gone by then. An empty path means the running program, for
  // tests that link a plugin's code in and export its REALPluginMain.
  explicit Runtime(const std::string& pluginPath, Options options = {});
  ~Runtime();
  Runtime(const Runtime&) = delete;
  Runtime& operator=(const Runtime&) = delete;

  // Makes the resolver withhold an entry, or answer it again.
  void SetWithheld(const std::string& entry, bool withheld);

  // A new instance (class constructor run), then the constructor method whose
  // declaration fits the arguments, if the class has constructor methods or
  // arguments are given.
  Object New(const std::string& className, std::initializer_list<Arg> args = {});
  Value Call(const Object& self, const std::string& method, std::initializer_list<Arg> args = {});
  Value CallGlobal(const std::string& method, std::initializer_list<Arg> args = {});
  Value Get(const Object& self, const std::string& property);
  void Set(const Object& self, const std::string& property, const Value& value);
  void SetEventHandler(const Object& self, const std::string& event, EventHandler handler);

  // Folder items: a host object holding a Windows path. MakeFolderItem takes a POSIX
  // path (made absolute) and maps it through drive Z:.
  Object MakeFolderItem(const std::string& posixPath);
  std::string FolderItemPath(const Object& item) const;  // the Windows path

  // Pictures: host objects of class Picture holding width x height pixels of 32 bits,
  // each with a graphics object and a device context drawing on it, as the plugin asks.
  // Depth is 32, 24, 16 or 8 (stored as 32 bits all the same); a new picture is white.
  // NewPicture throws HostError for a size or depth the host refuses.
  struct PictureSize {
    int width = 0, height = 0, depth = 0;
  };
  Object NewPicture(int width, int height, int depth = 32);
  PictureSize SizeOfPicture(const Object& picture) const;
  // One pixel as Color (&h00RRGGBB); throws HostError outside the picture.
  Color GetPixel(const Object& picture, int x, int y) const;
  void SetPixel(const Object& picture, int x, int y, Color color);
  // All pixels at once: width x height words &h00RRGGBB, rows top-down; valid while the
  // picture lives. The top byte of each word is not read.
  std::uint32_t* PicturePixels(const Object& picture);

  // What the plugin registered, in registration order.
  int pluginVersion() const;
  std::vector<const ClassInfo*> Classes() const;
  std::vector<const MethodInfo*> Globals() const;
  // Declarations the host could not parse at registration.
  const std::vector<std::string>& RegistrationErrors() const;
  // Order of the entries the plugin resolved, by name (each resolution attempt).
  const std::vector<std::string>& ResolvedEntries() const;

  // Live counts, and misuse the host detected (an unlock of a dead object or string).
  std::size_t LiveObjects() const;
  std::size_t LiveStrings() const;
  const std::vector<std::string>& Faults() const;
  // How often the plugin asked for an event handler.
  std::size_t EventLookups() const;

  struct Impl;

 private:
  std::unique_ptr<Impl> impl_;
};

}  // namespace host

#endif
