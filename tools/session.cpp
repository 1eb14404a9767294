#include "session.h"

#include <unistd.h>

#include <climits>
#include <cstdlib>

#include "host/declaration.h"

namespace tool {

namespace {

std::string ExecutableFolder() {
  char exe[PATH_MAX];
  const ssize_t n = readlink("/proc/self/exe", exe, sizeof exe - 1);
  if (n <= 0) return ".";
  std::string path(exe, static_cast<std::size_t>(n));
  return path.substr(0, path.rfind('/'));
}

}  // namespace

std::string BuiltinProfileFolder() {
  if (const char* env = std::getenv("TINTWELL_PROFILES"); env && *env) return env;
  return ExecutableFolder() + "/../share/tintwell";
}

std::vector<BuiltinProfile> BuiltinProfiles() {
  const std::string folder = BuiltinProfileFolder();
  return {
      {"srgb", "sRGB (IEC 61966-2-1)", folder + "/sRGB.icc"},
      {"lab", "CIE Lab, D50, identity", folder + "/LabD50.icc"},
      {"gray", "gray, gamma 2.2, D50", folder + "/Gray22.icc"},
      {"cmyk", "CMYK printer (default_cmyk.icc)", "/usr/share/color/icc/ghostscript/default_cmyk.icc"},
  };
}

Session::Session(const std::string& pluginPath, bool verbose) : runtime_(std::make_unique<host::Runtime>(pluginPath)) {
  if (!verbose) return;
  debugger_ = runtime_->New("halvoDebugger");
  auto keep = [this](const host::Object&, const std::vector<host::Value>& args) {
    std::string line;
    for (const host::Value& v : args) {
      if (!line.empty()) line += " ";
      if (v.IsString()) line += v.AsString();
      else if (v.IsInteger()) line += std::to_string(v.AsInteger());
      else if (v.IsDouble()) line += std::to_string(v.AsDouble());
      else if (v.IsBoolean()) line += v.AsBoolean() ? "true" : "false";
    }
    traces_.push_back(line);
    return host::Value();
  };
  for (const char* event : {"DebugString", "DebugInteger", "DebugDouble", "DebugBoolean"})
    runtime_->SetEventHandler(debugger_, event, keep);
  runtime_->SetEventHandler(debugger_, "DebugError", [this](const host::Object&, const std::vector<host::Value>& args) {
    traces_.push_back("error " + std::to_string(args[0].AsInteger()));
    return host::Value();
  });
  runtime_->CallGlobal("halvoRegisterDebugger", {debugger_});
}

Session::~Session() {
  if (debugger_) runtime_->CallGlobal("halvoUnregisterDebugger");
  debugger_ = host::Object();
}

void Session::Check(const std::string& message) {
  const int code = LastError();
  if (code != 0) throw JobError(message, code);
}

std::string Session::ProfilePath(const std::string& nameOrPath) {
  if (access(nameOrPath.c_str(), F_OK) == 0) return nameOrPath;
  for (const BuiltinProfile& b : BuiltinProfiles())
    if (host::EqualsIgnoreCase(b.name, nameOrPath)) return b.path;
  return nameOrPath;
}

host::Object Session::OpenProfile(const std::string& nameOrPath) {
  const std::string path = ProfilePath(nameOrPath);
  if (access(path.c_str(), R_OK) != 0) throw JobError("cannot read profile " + nameOrPath, 0);
  host::Object profile = runtime_->New("Profile", {runtime_->MakeFolderItem(path)});
  Check("cannot open profile " + nameOrPath);
  if (!runtime_->Call(profile, "ValidProfile").AsBoolean()) throw JobError("not a usable profile: " + nameOrPath, 0);
  return profile;
}

std::vector<std::string> Session::TakeTraces() {
  std::vector<std::string> taken;
  taken.swap(traces_);
  return taken;
}

host::Object Session::NewColorWorld(const host::Object& src, const host::Object& dst,
                                   const std::vector<host::Object>& via) {
  host::Object world;
  if (via.empty()) {
    world = runtime_->New("ColorWorld", {src, dst});
  } else {
    world = runtime_->New("ColorWorld");
    const host::Value second = via.size() > 1 ? host::Value(via[1]) : host::Value();
    runtime_->Call(world, "ConcatColorWorld", {0, src, via[0], second, dst});
  }
  Check("cannot build a colour world from these profiles");
  return world;
}

}  // namespace tool
