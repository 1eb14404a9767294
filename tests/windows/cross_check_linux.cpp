// The cross-check session on Linux: the plugin through the project's host, on the
// stand-in Win32 layer.
//   cross_check_linux PLUGIN SRGB.icc LAB.icc   writes the report to stdout
#include <cstdio>
#include <string>
#include <vector>

#include "cross_check.h"
#include "host/runtime.h"

namespace {

class LinuxHost {
 public:
  explicit LinuxHost(const std::string& plugin) : rt_(plugin) {}

  host::Object NewDebugger() {
    host::Object d = rt_.New("halvoDebugger");
    for (const char* name : {"DebugError", "DebugInteger", "DebugDouble", "DebugBoolean", "DebugString"}) {
      const std::string event = name;
      rt_.SetEventHandler(d, event, [this, event](const host::Object&, const std::vector<host::Value>& args) {
        std::string text = event + ":";
        for (std::size_t i = 0; i < args.size(); ++i) {
          if (i) text += ",";
          const host::Value& v = args[i];
          if (v.IsString()) text += v.AsString();
          else if (v.IsInteger()) text += std::to_string(v.AsInteger());
          else if (v.IsBoolean()) text += v.AsBoolean() ? "true" : "false";
          else if (v.IsDouble()) text += std::to_string(v.AsDouble());
        }
        traces_.push_back(text);
        return host::Value();
      });
    }
    rt_.CallGlobal("halvoRegisterDebugger", {d});
    return d;
  }
  host::Object OpenProfile(const std::string& path) { return rt_.New("Profile", {rt_.MakeFolderItem(path)}); }
  host::Object NewColorWorld(const host::Object& a, const host::Object& b) { return rt_.New("ColorWorld", {a, b}); }
  host::Object NewColor() { return rt_.New("CMColor"); }
  void SetDouble(const host::Object& o, const char* p, double v) { rt_.Set(o, p, v); }
  double GetDouble(const host::Object& o, const char* p) { return rt_.Get(o, p).AsDouble(); }
  int GetInteger(const host::Object& o, const char* p) { return rt_.Get(o, p).AsInteger(); }
  std::string GetString(const host::Object& o, const char* p) { return rt_.Get(o, p).AsString(); }
  void Match(const host::Object& world, const host::Object& color) { rt_.Call(world, "MatchCMcolor", {color}); }
  int Error() { return rt_.CallGlobal("CMError").AsInteger(); }
  void Release(host::Object& o) { o = host::Object(); }
  void Unregister() { rt_.CallGlobal("halvoUnregisterDebugger"); }
  std::string GetLocationName(const host::Object& o, const char* p) {
    const std::string path = rt_.FolderItemPath(rt_.Get(o, p).AsObject());
    return path.substr(path.find_last_of('\\') + 1);
  }
  std::size_t LiveObjects() const { return rt_.LiveObjects(); }
  std::size_t LiveStrings() const { return rt_.LiveStrings(); }
  const std::vector<std::string>& Traces() const { return traces_; }
  const std::vector<std::string>& Faults() const { return rt_.Faults(); }

 private:
  host::Runtime rt_;
  std::vector<std::string> traces_;
};

}  // namespace

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: %s PLUGIN SRGB_PROFILE LAB_PROFILE\n", argv[0]);
    return 2;
  }
  try {
    LinuxHost host(argv[1]);
    const int status = cross_check::Run(host, argv[2], argv[3], stdout);
    for (const std::string& f : host.Faults()) std::printf("fault %s\n", f.c_str());
    return host.Faults().empty() ? status : 1;
  } catch (const std::exception& e) {
    std::fprintf(stderr, "cross_check_linux: %s\n", e.what());
    return 1;
  }
}
