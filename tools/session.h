// The tool's script context: the host with the plugin loaded, a registered debugger
// whose traces are kept for --verbose, and the helpers every command shares.
#ifndef TINTWELL_TOOLS_SESSION_H
#define TINTWELL_TOOLS_SESSION_H

#include <stdexcept>
#include <string>
#include <vector>

#include "host/runtime.h"
#include "input_parse.h"  // UsageError

namespace tool {

// A job that failed: the message, and the plugin's CMError() code at the time.
class JobError : public std::runtime_error {
 public:
  JobError(const std::string& what, int code) : std::runtime_error(what), code_(code) {}
  int code() const { return code_; }

 private:
  int code_;
};

class Session {
 public:
  Session(const std::string& pluginPath, bool verbose);
  ~Session();

  host::Runtime& rt() { return *runtime_; }
  int LastError() { return runtime_->CallGlobal("CMError").AsInteger(); }
  // Throws JobError with message when the plugin's last error is not 0.
  void Check(const std::string& message);

  // Opens a profile given as a file path or the name of a built-in profile.
  host::Object OpenProfile(const std::string& nameOrPath);
  // The file a profile argument names: the path itself when it exists, else the file of
  // the built-in profile of that name, else the argument unchanged.
  static std::string ProfilePath(const std::string& nameOrPath);
  // The colour world src -> dst, through up to two profiles between them; throws
  // JobError when the plugin cannot build it.
  host::Object NewColorWorld(const host::Object& src, const host::Object& dst, const std::vector<host::Object>& via);
  // The traces the plugin sent since the last call (texts and values, one a line).
  std::vector<std::string> TakeTraces();

 private:
  std::unique_ptr<host::Runtime> runtime_;
  host::Object debugger_;
  std::vector<std::string> traces_;
};

// The folder of built-in profiles shipped beside the tool, and their names.
std::string BuiltinProfileFolder();
struct BuiltinProfile {
  const char* name;
  const char* description;
  std::string path;
};
std::vector<BuiltinProfile> BuiltinProfiles();

}  // namespace tool

#endif
