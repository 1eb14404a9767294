// The tag commands: every tag of a profile listed, one tag decoded, and tag edits saved.
// Tags are read and changed through the plugin's Profile members; only the offsets and
// the sharing of data, which no member reports, come from the file's own tag table.
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <map>

#include "commands.h"
#include "output.h"

namespace tool {

namespace {

// A signature from the command line: one to four printable characters, padded with
// spaces as ICC signatures are ("XYZ" is "XYZ ").
std::string Signature(const std::string& text) {
  if (text.empty() || text.size() > 4) throw UsageError("a tag signature has 1 to 4 characters, not '" + text + "'");
  for (unsigned char c : text)
    if (c < 0x20 || c >= 0x7F) throw UsageError("a tag signature is printable text, not '" + Printable(text) + "'");
  return text + std::string(4 - text.size(), ' ');
}

struct TableEntry {
  uint32_t offset = 0, size = 0;
};

uint32_t BE32(const std::string& b, std::size_t at) {
  return static_cast<uint32_t>(static_cast<uint8_t>(b[at])) << 24 | static_cast<uint32_t>(static_cast<uint8_t>(b[at + 1])) << 16 |
         static_cast<uint32_t>(static_cast<uint8_t>(b[at + 2])) << 8 | static_cast<uint8_t>(b[at + 3]);
}

// The file's tag table by signature; empty when the file holds no whole table.
std::map<std::string, TableEntry> ReadTagTable(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  const std::string b((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  std::map<std::string, TableEntry> table;
  if (b.size() < 132) return table;
  const uint64_t count = BE32(b, 128);
  if (count > (b.size() - 132) / 12) return table;
  for (uint64_t i = 0; i < count; ++i) {
    const std::size_t at = static_cast<std::size_t>(132 + 12 * i);
    table[b.substr(at, 4)] = {BE32(b, at + 4), BE32(b, at + 8)};
  }
  return table;
}

std::string HexDump(const std::string& bytes) {
  std::string out;
  for (std::size_t row = 0; row < bytes.size(); row += 16) {
    char text[24];
    std::snprintf(text, sizeof text, "%08zx ", row);
    out += text;
    std::string ascii;
    for (std::size_t i = row; i < row + 16; ++i) {
      if (i % 8 == 0) out += ' ';
      if (i < bytes.size()) {
        const unsigned char c = static_cast<unsigned char>(bytes[i]);
        std::snprintf(text, sizeof text, "%02x ", c);
        out += text;
        ascii += c >= 0x20 && c < 0x7F ? static_cast<char>(c) : '.';
      } else {
        out += "   ";
      }
    }
    out += " |" + ascii + "|\n";
  }
  return out;
}

std::string HexString(const std::string& bytes) {
  std::string out;
  char text[3];
  for (unsigned char c : bytes) {
    std::snprintf(text, sizeof text, "%02x", c);
    out += text;
  }
  return out;
}

// A text tag's bytes end with their stored zero; show the text before it.
std::string UpToZero(const std::string& text) { return text.substr(0, text.find('\0')); }

std::string List(const std::vector<double>& values, const char* separator) {
  std::string out;
  for (std::size_t i = 0; i < values.size(); ++i) out += (i ? separator : "") + Number(values[i]);
  return out;
}

std::vector<double> VectorValues(host::Runtime& rt, const host::Object& v) {
  std::vector<double> values;
  const int32_t n = rt.Get(v, "size").AsInteger();
  for (int32_t i = 0; i < n; ++i) values.push_back(rt.Call(v, "Get", {i}).AsDouble());
  return values;
}

void PrintCurve(Session& s, const host::Object& p, const std::string& sig, const Options& options) {
  host::Runtime& rt = s.rt();
  host::Object v = rt.New("Vector");
  rt.Call(p, "GetTRC", {sig, v});
  s.Check("cannot read curve " + sig);
  const std::vector<double> values = VectorValues(rt, v);
  if (options.json) {
    if (values.size() == 1)
      std::printf("{\"tag\": %s, \"gamma\": %s}\n", JsonString(sig).c_str(), Number(values[0]).c_str());
    else
      std::printf("{\"tag\": %s, \"entries\": [%s]}\n", JsonString(sig).c_str(), List(values, ", ").c_str());
  } else if (values.size() == 1) {
    std::printf("gamma %s\n", Number(values[0]).c_str());
  } else {
    std::printf("%zu entries%s\n", values.size(), values.empty() ? " (identity)" : "");
    for (std::size_t i = 0; i < values.size(); ++i) std::printf("%6zu  %s\n", i, Number(values[i]).c_str());
  }
}

void PrintXYZ(Session& s, const host::Object& p, const std::string& sig, const Options& options) {
  host::Value x = 0.0, y = 0.0, z = 0.0;
  s.rt().Call(p, "GetXYZTag", {sig, host::ByRef(x), host::ByRef(y), host::ByRef(z)});
  s.Check("cannot read XYZ tag " + sig);
  const std::vector<double> xyz = {x.AsDouble(), y.AsDouble(), z.AsDouble()};
  if (options.json)
    std::printf("{\"tag\": %s, \"XYZ\": [%s]}\n", JsonString(sig).c_str(), List(xyz, ", ").c_str());
  else
    std::printf("X %s  Y %s  Z %s\n", Number(xyz[0]).c_str(), Number(xyz[1]).c_str(), Number(xyz[2]).c_str());
}

void PrintText(Session& s, const host::Object& p, const std::string& sig, const char* member, const Options& options) {
  const host::Value v = s.rt().Call(p, member, {sig});
  s.Check("cannot read text of " + sig);
  const std::string text = v.IsString() ? UpToZero(v.AsString()) : "";
  if (options.json)
    std::printf("{\"tag\": %s, \"text\": %s}\n", JsonString(sig).c_str(), JsonString(text).c_str());
  else
    std::printf("%s\n", Printable(text).c_str());
}

void PrintNamedColors(Session& s, const host::Object& p, const std::string& sig, const Options& options) {
  host::Runtime& rt = s.rt();
  host::Object list = rt.New("VectorNC");
  rt.Call(p, "GetNC", {sig, list});
  s.Check("cannot read named colours of " + sig);
  const std::string prefix = rt.Get(list, "prefix").AsString(), suffix = rt.Get(list, "suffix").AsString();
  const int32_t devices = rt.Get(list, "devicecount").AsInteger();
  const int32_t n = rt.Get(list, "size").AsInteger();
  if (options.json)
    std::printf("{\"tag\": %s, \"prefix\": %s, \"suffix\": %s, \"deviceCoordinates\": %d, \"colors\": [",
                JsonString(sig).c_str(), JsonString(prefix).c_str(), JsonString(suffix).c_str(), devices);
  else
    std::printf("%d colours, prefix '%s', suffix '%s', %d device coordinates\n", n, Printable(prefix).c_str(),
                Printable(suffix).c_str(), devices);
  host::Object pcs = rt.New("Vector"), device = rt.New("Vector");
  for (int32_t i = 0; i < n; ++i) {
    host::Value name = "";
    rt.Call(list, "Get", {i, host::ByRef(name), pcs, device});
    const std::string root = name.IsString() ? name.AsString() : "";
    const std::vector<double> lab = VectorValues(rt, pcs), values = VectorValues(rt, device);
    if (options.json)
      std::printf("%s\n  {\"name\": %s, \"Lab\": [%s], \"device\": [%s]}", i ? "," : "", JsonString(root).c_str(),
                  List(lab, ", ").c_str(), List(values, ", ").c_str());
    else
      std::printf("%6d  %-32s  Lab %s  device %s\n", i + 1, Printable(root).c_str(), List(lab, " ").c_str(),
                  List(values, " ").c_str());
  }
  if (options.json) std::printf("%s]}\n", n ? "\n" : "");
}

void PrintRaw(const std::string& sig, const std::string& bytes, const Options& options) {
  if (options.json)
    std::printf("{\"tag\": %s, \"type\": %s, \"size\": %zu, \"hex\": \"%s\"}\n", JsonString(sig).c_str(),
                JsonString(bytes.substr(0, 4)).c_str(), bytes.size(), HexString(bytes).c_str());
  else
    std::fputs(HexDump(bytes).c_str(), stdout);
}

}  // namespace

int TagsCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 1) throw UsageError("tags needs one profile");
  host::Runtime& rt = session.rt();
  host::Object p = session.OpenProfile(args[0]);
  const int32_t count = rt.Get(p, "TagCount").AsInteger();
  session.Check("cannot count the tags of " + args[0]);
  const std::map<std::string, TableEntry> table = ReadTagTable(Session::ProfilePath(args[0]));
  if (options.json) std::printf("[");
  else std::printf("%4s  %-4s  %-4s  %8s  %8s\n", "#", "tag", "type", "offset", "size");
  for (int32_t i = 1; i <= count; ++i) {
    const host::Value name = rt.Call(p, "TagName", {i});
    const host::Value data = rt.Call(p, "TagData", {i});
    session.Check("cannot read tag " + std::to_string(i));
    const std::string sig = name.IsString() ? name.AsString() : "";
    const std::string bytes = data.IsString() ? data.AsString() : "";
    const std::string type = bytes.substr(0, 4);
    const auto entry = table.find(sig);
    std::vector<std::string> sharing;
    if (entry != table.end())
      for (const auto& other : table)
        if (other.first != sig && other.second.offset == entry->second.offset && other.second.size == entry->second.size)
          sharing.push_back(other.first);
    const std::string offset = entry != table.end() ? std::to_string(entry->second.offset) : "";
    if (options.json) {
      std::string shared;
      for (const std::string& s : sharing) shared += (shared.empty() ? "" : ", ") + JsonString(s);
      std::printf("%s\n  {\"index\": %d, \"tag\": %s, \"type\": %s, \"offset\": %s, \"size\": %zu, \"sharedWith\": [%s]}",
                  i > 1 ? "," : "", i, JsonString(sig).c_str(), JsonString(type).c_str(),
                  offset.empty() ? "null" : offset.c_str(), bytes.size(), shared.c_str());
    } else {
      std::string shared;
      for (const std::string& s : sharing) shared += " " + Printable(s);
      std::printf("%4d  %-4s  %-4s  %8s  %8zu%s%s\n", i, Printable(sig).c_str(), Printable(type).c_str(),
                  offset.empty() ? "-" : offset.c_str(), bytes.size(), shared.empty() ? "" : "  shared with",
                  shared.c_str());
    }
  }
  if (options.json) std::printf("%s]\n", count > 0 ? "\n" : "");
  return 0;
}

int TagCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 2) throw UsageError("tag needs a profile and a tag signature");
  const std::string sig = Signature(args[1]);
  host::Runtime& rt = session.rt();
  host::Object p = session.OpenProfile(args[0]);
  if (!rt.Call(p, "TagExists", {sig}).AsBoolean()) throw JobError("no tag '" + sig + "' in " + args[0], 0);
  const host::Value data = rt.Call(p, "TagData", {sig});
  session.Check("cannot read tag '" + sig + "'");
  const std::string bytes = data.IsString() ? data.AsString() : "";
  const std::string type = bytes.substr(0, 4);
  if (options.raw) PrintRaw(sig, bytes, options);
  else if (type == "curv" || type == "para") PrintCurve(session, p, sig, options);
  else if (type == "XYZ ") PrintXYZ(session, p, sig, options);
  else if (type == "text") PrintText(session, p, sig, "GetTextTypeTag", options);
  else if (type == "desc" || type == "mluc") PrintText(session, p, sig, "GetDescTypeTag", options);
  else if (type == "ncl2") PrintNamedColors(session, p, sig, options);
  else {
    if (!options.json) std::printf("type '%s' is not decoded; its bytes:\n", Printable(type).c_str());
    PrintRaw(sig, bytes, options);
  }
  return 0;
}

int EditCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 1) throw UsageError("edit needs one profile");
  if (options.edits.empty()) throw UsageError("edit needs --desc, --copyright, --remove or --copy-tag");
  // A built-in profile is shared by every user of the tool: it is never edited in place.
  if (options.output.empty() && access(args[0].c_str(), F_OK) != 0)
    throw UsageError("no profile file " + args[0] + " to edit in place (give -o OUT to save a copy)");
  // Every signature is checked before the profile changes.
  std::vector<std::pair<std::string, std::string>> signatures;
  for (const Edit& e : options.edits) {
    if (e.kind == Edit::Remove) signatures.push_back({Signature(e.value), ""});
    if (e.kind != Edit::CopyTag) continue;
    const std::size_t eq = e.value.find('=');
    if (eq == std::string::npos) throw UsageError("--copy-tag takes NEW=EXISTING, not '" + e.value + "'");
    signatures.push_back({Signature(e.value.substr(0, eq)), Signature(e.value.substr(eq + 1))});
  }
  host::Runtime& rt = session.rt();
  host::Object p = session.OpenProfile(args[0]);
  std::size_t next = 0;
  for (const Edit& e : options.edits) {
    switch (e.kind) {
      case Edit::Description:
        rt.Call(p, "SetDescTypeTag", {"desc", e.value});
        session.Check("cannot write the description");
        break;
      case Edit::Copyright:
        rt.Set(p, "Copyright", e.value);
        session.Check("cannot write the copyright");
        break;
      case Edit::Remove: {
        const std::string sig = signatures[next++].first;
        if (rt.Call(p, "RemoveTag", {sig}).AsInteger() == 0)
          throw JobError("cannot remove tag '" + sig + "'", session.LastError());
        break;
      }
      case Edit::CopyTag: {
        const auto& pair = signatures[next++];
        if (rt.Call(p, "SetTagRef", {pair.first, pair.second}).AsInteger() == 0)
          throw JobError("cannot copy tag '" + pair.second + "' to '" + pair.first + "'", session.LastError());
        break;
      }
    }
  }
  std::string saved = args[0];
  if (options.output.empty()) {
    rt.Call(p, "SaveProfile");
  } else {
    rt.Call(p, "SaveProfileAs", {rt.MakeFolderItem(options.output)});
    saved = options.output;
  }
  session.Check("cannot save " + saved);
  if (options.json)
    std::printf("{\"saved\": %s, \"edits\": %zu}\n", JsonString(saved).c_str(), options.edits.size());
  else
    std::printf("saved %s (%zu edit%s)\n", saved.c_str(), options.edits.size(), options.edits.size() == 1 ? "" : "s");
  return 0;
}

}  // namespace tool
