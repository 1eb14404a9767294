// The commands that find and make profiles: search the colour directory, write a device
// link, a blank profile or a copy. Each is one call of the plugin's global methods.
#include <cstdio>

#include "commands.h"
#include "output.h"

namespace tool {

namespace {

// The POSIX path of a folder item's Windows path on drive Z:.
std::string PosixPath(const std::string& windows) {
  std::string path = windows.size() >= 2 && windows[1] == ':' ? windows.substr(2) : windows;
  for (char& c : path)
    if (c == '\\') c = '/';
  return path;
}

// The new Profile a global method answered, or a JobError with the plugin's code.
host::Object Made(Session& s, const host::Value& result, const std::string& what) {
  const int code = s.LastError();
  if (!result.IsObject() || code != 0) throw JobError("cannot write " + what, code);
  if (!s.rt().Call(result.AsObject(), "ValidProfile").AsBoolean()) throw JobError("not a usable profile: " + what, 0);
  return result.AsObject();
}

void NeedArgs(const std::vector<std::string>& args, std::size_t least, std::size_t most, const char* usage) {
  if (args.size() < least || args.size() > most) throw UsageError(std::string("usage: tintwell ") + usage);
}

}  // namespace

int SearchCommand(Session& s, const std::vector<std::string>& args, const Options& options) {
  NeedArgs(args, 0, 0, "search [--cmm X] [--class X] [--space X] [--pcs X] [--manufacturer X] [--model N]");
  host::Runtime& rt = s.rt();
  const SearchCriteria& c = options.search;
  host::Object list = rt.New("VectorF");
  rt.CallGlobal("ProfileSearch", {c.cmm, c.deviceClass, c.space, c.pcs, c.manufacturer, c.model, list});
  s.Check("cannot search the colour directory");
  const int32_t count = rt.Call(list, "Count").AsInteger();
  if (options.json) std::printf("[");
  for (int32_t i = 0; i < count; ++i) {
    const host::Value item = rt.Call(list, "Get", {i});
    if (!item.IsObject()) continue;
    const std::string path = PosixPath(rt.FolderItemPath(item.AsObject()));
    host::Object p = rt.New("Profile", {item});
    const std::string cls = rt.Get(p, "Type").AsString();
    const std::string description = rt.Get(p, "Name").AsString();
    if (options.json)
      std::printf("%s\n  {\"path\": %s, \"class\": %s, \"description\": %s}", i ? "," : "", JsonString(path).c_str(),
                  JsonString(cls).c_str(), JsonString(description).c_str());
    else
      std::printf("%s  %s  %s\n", path.c_str(), Printable(cls).c_str(), Printable(description).c_str());
  }
  if (options.json) std::printf("%s]\n", count ? "\n" : "");
  return 0;
}

int LinkCommand(Session& s, const std::vector<std::string>& args, const Options& options) {
  NeedArgs(args, 3, 5, "link OUT P1 P2 [P3 P4] [--intent N]");
  host::Runtime& rt = s.rt();
  std::vector<host::Value> chain(4);
  for (std::size_t i = 1; i < args.size(); ++i) {
    host::Object p = s.OpenProfile(args[i]);
    if (options.intent >= 0) rt.Set(p, "RenderIntent", options.intent);  // the working copy only
    chain[i - 1] = p;
  }
  const host::Value link =
      rt.CallGlobal("NewLinkProfile", {rt.MakeFolderItem(args[0]), 0, chain[0], chain[1], chain[2], chain[3]});
  Made(s, link, "device link " + args[0]);
  return 0;
}

int BlankCommand(Session& s, const std::vector<std::string>& args, const Options&) {
  NeedArgs(args, 1, 1, "blank OUT");
  Made(s, s.rt().CallGlobal("BlankProfile", {s.rt().MakeFolderItem(args[0])}), "blank profile " + args[0]);
  return 0;
}

int CopyCommand(Session& s, const std::vector<std::string>& args, const Options&) {
  NeedArgs(args, 2, 2, "copy SRC OUT");
  host::Object source = s.OpenProfile(args[0]);
  Made(s, s.rt().CallGlobal("CopyProfile", {s.rt().MakeFolderItem(args[1]), source}), "copy " + args[1]);
  return 0;
}

}  // namespace tool
