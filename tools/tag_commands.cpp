// The tag commands: every tag of a profile listed, one tag decoded, and tag edits saved.
// Tags are read and changed through the plugin's Profile members; only the offsets and
// the sharing of data, which no member reports, come from the file's own tag table.
#include <unistd.h>

#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <map>

#include "commands.h"
#include "json_read.h"
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

// A lut value for --json: the shortest text that reads back as the same double, so a
// dumped matrix element (a multiple of 1/65536) survives the trip through the file.
std::string Exact(double value) {
  if (!std::isfinite(value)) return "null";
  char text[32];
  const auto end = std::to_chars(text, text + sizeof text, value).ptr;
  return std::string(text, end);
}

std::string ExactList(const std::vector<double>& values) {
  std::string out;
  out.reserve(values.size() * 7);
  for (std::size_t i = 0; i < values.size(); ++i) {
    if (i) out += ", ";
    out += Exact(values[i]);
  }
  return out;
}

// The nine matrix elements e00, e01, ..., e22 of the tag: the Matrix keeps them by
// (column, row).
std::vector<double> MatrixValues(host::Runtime& rt, const host::Object& m) {
  std::vector<double> values;
  for (int32_t row = 0; row < 3; ++row)
    for (int32_t column = 0; column < 3; ++column) values.push_back(rt.Call(m, "get", {column, row}).AsDouble());
  return values;
}

host::Object LutMember(host::Runtime& rt, const host::Object& lut, const char* name) {
  const host::Value v = rt.Get(lut, name);
  if (!v.IsObject()) throw JobError(std::string("the lut has no ") + name, 0);
  return v.AsObject();
}

void PrintLut(Session& s, const host::Object& p, const std::string& sig, const Options& options) {
  host::Runtime& rt = s.rt();
  const host::Value got = rt.Call(p, "GetMFT", {sig});
  s.Check("cannot read lut " + sig);
  if (!got.IsObject()) throw JobError("cannot read lut " + sig, 0);
  const host::Object& lut = got.AsObject();
  const bool is16 = rt.Get(lut, "Is16Bit").AsBoolean();
  const int32_t in = rt.Get(lut, "InChannelCount").AsInteger(), out = rt.Get(lut, "OutChannelCount").AsInteger();
  const int32_t grid = rt.Get(lut, "GridPointCount").AsInteger();
  const int32_t inEntries = rt.Get(lut, "InputEntries").AsInteger();
  const int32_t outEntries = rt.Get(lut, "OutputEntries").AsInteger();
  const std::vector<double> matrix = MatrixValues(rt, LutMember(rt, lut, "Matrix3D"));
  const char* type = is16 ? "mft2" : "mft1";
  if (options.json) {
    const std::vector<double> inCurve = VectorValues(rt, LutMember(rt, lut, "InCurve"));
    const std::vector<double> clut = VectorValues(rt, LutMember(rt, lut, "Lut"));
    const std::vector<double> outCurve = VectorValues(rt, LutMember(rt, lut, "OutCurve"));
    std::printf("{\"tag\": %s, \"type\": \"%s\", \"inputChannels\": %d, \"outputChannels\": %d, \"gridPoints\": %d,\n"
                " \"inputEntries\": %d, \"outputEntries\": %d,\n \"matrix\": [%s],\n",
                JsonString(sig).c_str(), type, in, out, grid, inEntries, outEntries, ExactList(matrix).c_str());
    std::printf(" \"inCurve\": [%s],\n", ExactList(inCurve).c_str());
    std::printf(" \"lut\": [%s],\n", ExactList(clut).c_str());
    std::printf(" \"outCurve\": [%s]}\n", ExactList(outCurve).c_str());
    return;
  }
  const int32_t clutSize = rt.Get(LutMember(rt, lut, "Lut"), "size").AsInteger();
  std::printf("%s ('%s'): %d input%s, %d output%s, %d grid points\n", is16 ? "lut16" : "lut8", type, in,
              in == 1 ? "" : "s", out, out == 1 ? "" : "s", grid);
  std::printf("matrix         %s | %s | %s\n", List({matrix[0], matrix[1], matrix[2]}, " ").c_str(),
              List({matrix[3], matrix[4], matrix[5]}, " ").c_str(), List({matrix[6], matrix[7], matrix[8]}, " ").c_str());
  std::printf("input tables   %d x %d entries\n", in, inEntries);
  std::printf("clut           %d entries (%d^%d grid points x %d)\n", clutSize, grid, in, out);
  std::printf("output tables  %d x %d entries\n", out, outEntries);
}

// A lut as --lut-from takes it, checked whole before the profile is touched.
struct LutContents {
  bool is16 = true;
  int32_t in = 0, out = 0, grid = 0;
  std::vector<double> matrix, inCurve, clut, outCurve;
};

const JsonValue& Member(const JsonValue& object, const std::string& name, const std::string& file) {
  const auto m = object.members.find(name);
  if (m == object.members.end()) throw UsageError(file + ": no \"" + name + "\"");
  return m->second;
}

int32_t Count(const JsonValue& object, const std::string& name, int32_t low, int32_t high, const std::string& file) {
  const JsonValue& v = Member(object, name, file);
  if (v.kind != JsonValue::Kind::Number || v.number != std::floor(v.number) || v.number < low || v.number > high)
    throw UsageError(file + ": \"" + name + "\" is a whole number from " + std::to_string(low) + " to " +
                     std::to_string(high));
  return static_cast<int32_t>(v.number);
}

// An array of numbers from low to high; whole numbers only when whole is set.
std::vector<double> Numbers(const JsonValue& object, const std::string& name, double low, double high, bool whole,
                            const std::string& file) {
  const JsonValue& v = Member(object, name, file);
  if (v.kind != JsonValue::Kind::Array) throw UsageError(file + ": \"" + name + "\" is an array of numbers");
  std::vector<double> values;
  values.reserve(v.items.size());
  for (const JsonValue& item : v.items) {
    const std::string at = "\"" + name + "\"[" + std::to_string(values.size()) + "]";
    if (item.kind != JsonValue::Kind::Number) throw UsageError(file + ": " + at + " is not a number");
    if (item.number < low || item.number > high || (whole && item.number != std::floor(item.number)))
      throw UsageError(file + ": " + at + " is " + Exact(item.number) + ", not " + (whole ? "a whole number" : "a number") +
                       " from " + Exact(low) + " to " + Exact(high));
    values.push_back(item.number);
  }
  return values;
}

// The entries a channel's table holds, from the table's length: 256 in mft1, 2 to 4096 in
// mft2 (the sizes a 16-bit count field and the tag readers take).
std::size_t EntriesPerChannel(const std::vector<double>& table, int32_t channels, bool is16, const char* name,
                              const std::string& file) {
  const std::size_t n = table.size() / static_cast<std::size_t>(channels);
  if (table.size() % static_cast<std::size_t>(channels) != 0 || (is16 ? n < 2 || n > 4096 : n != 256))
    throw UsageError(file + ": \"" + name + "\" holds " + std::to_string(table.size()) + " values; " +
                     std::to_string(channels) + " channels need " +
                     (is16 ? "2 to 4096 entries each" : "256 entries each"));
  return n;
}

LutContents ReadLutFile(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  if (!in) throw UsageError("cannot read lut file " + file);
  std::string text;
  char buffer[65536];
  while (in.read(buffer, sizeof buffer) || in.gcount() > 0) {
    text.append(buffer, static_cast<std::size_t>(in.gcount()));
    if (text.size() > kJsonMaxBytes) throw UsageError(file + ": larger than a lut file may be");
  }
  JsonValue root;
  try {
    root = ParseJson(text);
  } catch (const JsonError& e) {
    throw UsageError(file + ": not valid JSON: " + e.what());
  }
  if (root.kind != JsonValue::Kind::Object) throw UsageError(file + ": a lut is a JSON object");
  for (const auto& m : root.members)
    if (m.first != "tag" && m.first != "type" && m.first != "inputChannels" && m.first != "outputChannels" &&
        m.first != "gridPoints" && m.first != "inputEntries" && m.first != "outputEntries" && m.first != "matrix" &&
        m.first != "inCurve" && m.first != "lut" && m.first != "outCurve")
      throw UsageError(file + ": unknown key \"" + Printable(m.first) + "\"");
  LutContents lut;
  const JsonValue& type = Member(root, "type", file);
  if (type.kind != JsonValue::Kind::String || (type.text != "mft1" && type.text != "mft2"))
    throw UsageError(file + ": \"type\" is \"mft1\" or \"mft2\"");
  lut.is16 = type.text == "mft2";
  lut.in = Count(root, "inputChannels", 1, 15, file);
  lut.out = Count(root, "outputChannels", 1, 15, file);
  lut.grid = Count(root, "gridPoints", 2, 255, file);
  // Elements the tag's s15Fixed16Number holds.
  lut.matrix = Numbers(root, "matrix", -32768.0, 32767.0 + 65535.0 / 65536.0, false, file);
  if (lut.matrix.size() != 9) throw UsageError(file + ": \"matrix\" holds 9 numbers, row by row");
  const double top = lut.is16 ? 65535 : 255;
  lut.inCurve = Numbers(root, "inCurve", 0, top, true, file);
  lut.clut = Numbers(root, "lut", 0, top, true, file);
  lut.outCurve = Numbers(root, "outCurve", 0, top, true, file);
  EntriesPerChannel(lut.inCurve, lut.in, lut.is16, "inCurve", file);
  EntriesPerChannel(lut.outCurve, lut.out, lut.is16, "outCurve", file);
  // grid^in x out, stopped as soon as it passes what the array holds.
  uint64_t points = static_cast<uint64_t>(lut.out);
  for (int32_t i = 0; i < lut.in && points <= lut.clut.size(); ++i) points *= static_cast<uint64_t>(lut.grid);
  if (points != lut.clut.size())
    throw UsageError(file + ": \"lut\" holds " + std::to_string(lut.clut.size()) + " values, not " +
                     std::to_string(lut.grid) + "^" + std::to_string(lut.in) + " grid points x " +
                     std::to_string(lut.out) + " outputs");
  return lut;
}

void Fill(host::Runtime& rt, const host::Object& lut, const char* name, const std::vector<double>& values) {
  const host::Object v = LutMember(rt, lut, name);
  for (double x : values) rt.Call(v, "Append", {x});
}

void WriteLut(Session& s, const host::Object& p, const std::string& sig, const LutContents& contents) {
  host::Runtime& rt = s.rt();
  host::Object lut = rt.New("cLut");
  rt.Set(lut, "Is16Bit", contents.is16);
  rt.Set(lut, "InChannelCount", contents.in);
  rt.Set(lut, "OutChannelCount", contents.out);
  rt.Set(lut, "GridPointCount", contents.grid);
  const host::Object m = LutMember(rt, lut, "Matrix3D");
  for (int32_t row = 0; row < 3; ++row)
    for (int32_t column = 0; column < 3; ++column)
      rt.Call(m, "set", {contents.matrix[static_cast<std::size_t>(row * 3 + column)], column, row});
  Fill(rt, lut, "InCurve", contents.inCurve);
  Fill(rt, lut, "Lut", contents.clut);
  Fill(rt, lut, "OutCurve", contents.outCurve);
  rt.Call(p, "SetMFT", {sig, lut});
  s.Check("cannot write lut '" + sig + "'");
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
  else if (type == "mft1" || type == "mft2") PrintLut(session, p, sig, options);
  else {
    if (!options.json) std::printf("type '%s' is not decoded; its bytes:\n", Printable(type).c_str());
    PrintRaw(sig, bytes, options);
  }
  return 0;
}

int EditCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 1) throw UsageError("edit needs one profile");
  if (options.edits.empty()) throw UsageError("edit needs --desc, --copyright, --remove, --copy-tag or --lut-from");
  // A built-in profile is shared by every user of the tool: it is never edited in place.
  if (options.output.empty() && access(args[0].c_str(), F_OK) != 0)
    throw UsageError("no profile file " + args[0] + " to edit in place (give -o OUT to save a copy)");
  // Every signature and lut file is checked before the profile changes.
  std::vector<std::pair<std::string, std::string>> signatures;
  std::vector<LutContents> luts;
  for (const Edit& e : options.edits) {
    if (e.kind == Edit::Remove) signatures.push_back({Signature(e.value), ""});
    if (e.kind == Edit::LutFrom) {
      signatures.push_back({Signature(e.tag), ""});
      luts.push_back(ReadLutFile(e.value));
    }
    if (e.kind != Edit::CopyTag) continue;
    const std::size_t eq = e.value.find('=');
    if (eq == std::string::npos) throw UsageError("--copy-tag takes NEW=EXISTING, not '" + e.value + "'");
    signatures.push_back({Signature(e.value.substr(0, eq)), Signature(e.value.substr(eq + 1))});
  }
  host::Runtime& rt = session.rt();
  host::Object p = session.OpenProfile(args[0]);
  std::size_t next = 0, nextLut = 0;
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
      case Edit::LutFrom:
        WriteLut(session, p, signatures[next++].first, luts[nextLut++]);
        break;
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
