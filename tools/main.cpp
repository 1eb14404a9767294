// tintwell: the command-line way into the colour-management plugin. Every job is done
// through the plugin's registered classes and methods, via the host runtime.
#include <unistd.h>

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>

#include "host/runtime.h"

namespace {

constexpr int kExitFailure = 1;
constexpr int kExitUsage = 2;

const char kUsage[] =
    "usage: tintwell [--plugin PATH] COMMAND [ARGS]\n"
    "\n"
    "Commands:\n"
    "  list      load the plugin and list the classes and global methods it registers,\n"
    "            with their declarations\n"
    "\n"
    "Options:\n"
    "  --plugin PATH   the plugin library to load (default: $TINTWELL_PLUGIN, else\n"
    "                  ../lib/libtintwell.so beside this program)\n"
    "  -h, --help      show this help\n";

// The plugin beside the tool, as the build and the install lay them out.
std::string DefaultPluginPath() {
  if (const char* env = std::getenv("TINTWELL_PLUGIN"); env && *env) return env;
  char exe[PATH_MAX];
  const ssize_t n = readlink("/proc/self/exe", exe, sizeof exe - 1);
  if (n <= 0) return "libtintwell.so";
  exe[n] = '\0';
  std::string dir(exe);
  dir.erase(dir.rfind('/'));
  return dir + "/../lib/libtintwell.so";
}

int List(host::Runtime& runtime) {
  std::printf("plugin interface version %d\n", runtime.pluginVersion());
  for (const host::ClassInfo* cls : runtime.Classes()) {
    std::printf("\nclass %s (%zu bytes of instance data)\n", cls->name.c_str(), cls->dataSize);
    for (const auto& p : cls->properties)
      std::printf("  property %s as %s%s\n", p.name.c_str(), host::TypeName(p.type).c_str(),
                  p.readOnly ? " (read-only)" : "");
    for (const auto& m : cls->methods) std::printf("  method   %s\n", m.declaration.c_str());
    for (const auto& e : cls->events) std::printf("  event    %s\n", e.declaration.c_str());
  }
  std::printf("\nglobal methods\n");
  for (const host::MethodInfo* m : runtime.Globals()) std::printf("  %s\n", m->declaration.c_str());
  return runtime.RegistrationErrors().empty() ? 0 : kExitFailure;
}

}  // namespace

int main(int argc, char** argv) {
  std::string pluginPath = DefaultPluginPath();
  int i = 1;
  for (; i < argc && argv[i][0] == '-'; ++i) {
    if (!std::strcmp(argv[i], "-h") || !std::strcmp(argv[i], "--help")) {
      std::fputs(kUsage, stdout);
      return 0;
    }
    if (!std::strcmp(argv[i], "--plugin") && i + 1 < argc) {
      pluginPath = argv[++i];
      continue;
    }
    std::fprintf(stderr, "tintwell: unknown option %s\n%s", argv[i], kUsage);
    return kExitUsage;
  }
  if (i >= argc) {
    std::fputs(kUsage, stderr);
    return kExitUsage;
  }
  const std::string command = argv[i];
  if (command != "list") {
    std::fprintf(stderr, "tintwell: unknown command %s\n%s", command.c_str(), kUsage);
    return kExitUsage;
  }
  try {
    host::Runtime runtime(pluginPath);
    return List(runtime);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "tintwell: %s\n", e.what());
    return kExitFailure;
  }
}
