#include "commands.h"


#include "color_values.h"
#include "output.h"

namespace tool {

namespace {

std::string SpaceOf(Session& s, const host::Object& profile) { return s.rt().Get(profile, "ColorSpace").AsString(); }

// ---- info ----

struct Field {
  const char* label;
  const char* property;
  enum { Text, Integer, Hex, Real, Flag } kind;
};

const Field kFields[] = {
    {"class", "Type", Field::Text},
    {"colour space", "ColorSpace", Field::Text},
    {"connection space", "ConnectionSpace", Field::Text},
    {"version", "Version", Field::Hex},
    {"size", "Size", Field::Integer},
    {"preferred CMM", "CMM", Field::Text},
    {"platform", "Platform", Field::Text},
    {"manufacturer", "Manufacturer", Field::Text},
    {"model", "Model", Field::Integer},
    {"creator", "Creator", Field::Text},
    {"signature", "Signature", Field::Text},
    {"rendering intent", "RenderIntent", Field::Integer},
    {"flags", "Flags", Field::Hex},
    {"embedded", "Embedded", Field::Flag},
    {"embedded use only", "EmbeddedUse", Field::Flag},
    {"quality", "Quality", Field::Integer},
    {"interpolation", "Interpolation", Field::Flag},
    {"gamut check", "GamutCheck", Field::Flag},
    {"attributes", "Attribute1", Field::Hex},
    {"attributes 2", "Attribute2", Field::Hex},
    {"transparent", "Transparent", Field::Flag},
    {"matte", "Matte", Field::Flag},
    {"white X", "WhiteX", Field::Real},
    {"white Y", "WhiteY", Field::Real},
    {"white Z", "WhiteZ", Field::Real},
};

std::string Hex(int32_t v) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%08X", static_cast<unsigned>(v));
  return text;
}

std::string Date(host::Runtime& rt, const host::Object& p) {
  char text[32];
  std::snprintf(text, sizeof text, "%04d-%02d-%02d %02d:%02d:%02d", rt.Get(p, "Year").AsInteger(),
                rt.Get(p, "Month").AsInteger(), rt.Get(p, "Day").AsInteger(), rt.Get(p, "Hour").AsInteger(),
                rt.Get(p, "Minute").AsInteger(), rt.Get(p, "Second").AsInteger());
  return text;
}

}  // namespace

int ListCommand(Session& session, const std::vector<std::string>& args, const Options&) {
  if (!args.empty()) throw UsageError("list takes no arguments");
  host::Runtime& rt = session.rt();
  std::printf("plugin interface version %d\n", rt.pluginVersion());
  for (const host::ClassInfo* cls : rt.Classes()) {
    std::printf("\nclass %s (%zu bytes of instance data)\n", cls->name.c_str(), cls->dataSize);
    for (const auto& p : cls->properties)
      std::printf("  property %s as %s%s\n", p.name.c_str(), host::TypeName(p.type).c_str(),
                  p.readOnly ? " (read-only)" : "");
    for (const auto& m : cls->methods) std::printf("  method   %s\n", m.declaration.c_str());
    for (const auto& e : cls->events) std::printf("  event    %s\n", e.declaration.c_str());
  }
  std::printf("\nglobal methods\n");
  for (const host::MethodInfo* m : rt.Globals()) std::printf("  %s\n", m->declaration.c_str());
  if (!rt.RegistrationErrors().empty()) throw JobError("the host refused some declarations", 0);
  return 0;
}

int InfoCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  std::vector<std::string> names = args;
  if (names.empty()) names.push_back("srgb");
  host::Runtime& rt = session.rt();
  if (options.json) std::printf("[");
  for (std::size_t i = 0; i < names.size(); ++i) {
    host::Object p = session.OpenProfile(names[i]);
    const bool valid = rt.Call(p, "ValidProfile").AsBoolean();
    if (options.json) {
      std::printf("%s\n  {\"profile\": %s", i ? "," : "", JsonString(names[i]).c_str());
      for (const Field& f : kFields) {
        const host::Value v = rt.Get(p, f.property);
        std::string text;
        switch (f.kind) {
          case Field::Text: text = JsonString(v.AsString()); break;
          case Field::Integer:
          case Field::Hex: text = std::to_string(v.AsInteger()); break;
          case Field::Real: text = Number(v.AsDouble()); break;
          case Field::Flag: text = v.AsBoolean() ? "true" : "false"; break;
        }
        std::printf(", %s: %s", JsonString(f.property).c_str(), text.c_str());
      }
      std::printf(", \"Created\": %s, \"Valid\": %s}", JsonString(Date(rt, p)).c_str(), valid ? "true" : "false");
    } else {
      std::printf("%s%s\n", i ? "\n" : "", names[i].c_str());
      for (const Field& f : kFields) {
        const host::Value v = rt.Get(p, f.property);
        std::string text;
        switch (f.kind) {
          case Field::Text: text = "'" + Printable(v.AsString()) + "'"; break;
          case Field::Integer: text = std::to_string(v.AsInteger()); break;
          case Field::Hex: text = Hex(v.AsInteger()); break;
          case Field::Real: text = Number(v.AsDouble()); break;
          case Field::Flag: text = v.AsBoolean() ? "yes" : "no"; break;
        }
        std::printf("  %-18s %s\n", f.label, text.c_str());
      }
      std::printf("  %-18s %s\n  %-18s %s\n", "created", Date(rt, p).c_str(), "valid", valid ? "yes" : "no");
    }
  }
  if (options.json) std::printf("\n]\n");
  return 0;
}

int ConvertCommand(Session& session, const std::vector<std::string>& args, const Options& options, std::FILE* input) {
  if (args.size() < 2) throw UsageError("convert needs a source and a destination profile");
  if (options.via.size() > 2) throw UsageError("at most two --via profiles");
  host::Runtime& rt = session.rt();
  host::Object src = session.OpenProfile(args[0]);
  host::Object dst = session.OpenProfile(args[1]);
  std::vector<host::Object> via;
  for (const std::string& v : options.via) via.push_back(session.OpenProfile(v));
  if (options.intent >= 0) {
    rt.Set(src, "RenderIntent", options.intent);
    rt.Set(dst, "RenderIntent", options.intent);
  }
  // A named-colour profile takes colour indexes, whatever space its colours are in.
  const bool named = rt.Get(src, "Type").AsString() == "nmcl";
  const ColorAccess in = named ? NamedColorAccess() : AccessForSpace(SpaceOf(session, src));
  const ColorAccess out = AccessForSpace(SpaceOf(session, dst));

  host::Object world = session.NewColorWorld(src, dst, via);

  // Colours come from the arguments, or one a line from the input. All of them are
  // read and checked before the first is converted, so a bad value or line prints
  // nothing but the error.
  std::vector<std::vector<double>> colors;
  const std::size_t n = in.channels.size();
  if (args.size() > 2) {
    if ((args.size() - 2) % n != 0)
      throw UsageError("expected a multiple of " + std::to_string(n) + " values (" + in.range + ")");
    for (std::size_t i = 2; i < args.size(); i += n)
      colors.push_back(ParseColor({args.begin() + static_cast<std::ptrdiff_t>(i),
                                   args.begin() + static_cast<std::ptrdiff_t>(i + n)},
                                  in));
  } else {
    colors = ReadColors(input, in);
  }

  host::Object color = rt.New("CMColor");
  if (options.json) std::printf("[");
  for (std::size_t k = 0; k < colors.size(); ++k) {
    const std::vector<double>& values = colors[k];
    rt.Call(color, "reset");
    WriteColor(rt, color, in, values);
    rt.Call(world, "MatchCMcolor", {color});
    session.Check("the colour could not be converted");
    const std::vector<double> result = ReadColor(rt, color, out);
    std::string inText, outText;
    for (std::size_t i = 0; i < values.size(); ++i) inText += (i ? options.json ? ", " : " " : "") + Number(values[i]);
    for (std::size_t i = 0; i < result.size(); ++i) outText += (i ? options.json ? ", " : " " : "") + Number(result[i]);
    if (options.json)
      std::printf("%s\n  {\"in\": [%s], \"out\": [%s]}", k ? "," : "", inText.c_str(), outText.c_str());
    else
      std::printf("%s\n", outText.c_str());
  }
  if (options.json) std::printf("\n]\n");
  return 0;
}

int GamutCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 4) throw UsageError("gamut needs a profile and L a b");
  // The check encodes Lab in 16-bit words as CMColor does, so the same ranges hold.
  const std::vector<double> lab = ParseColor({args[1], args[2], args[3]}, AccessForSpace("Lab "));
  const double l = lab[0], a = lab[1], b = lab[2];
  host::Runtime& rt = session.rt();
  host::Object profile = session.OpenProfile(args[0]);
  host::Object labProfile = session.OpenProfile("lab");
  host::Object world = rt.New("ColorWorld", {labProfile, profile});
  session.Check("cannot build a colour world for " + args[0]);
  const bool inside = rt.Call(world, "CheckLAB", {l, a, b}).AsBoolean();
  session.Check("the gamut could not be checked");
  if (options.json)
    std::printf("{\"L\": %s, \"a\": %s, \"b\": %s, \"inGamut\": %s}\n", Number(l).c_str(), Number(a).c_str(),
                Number(b).c_str(), inside ? "true" : "false");
  else
    std::printf("%s\n", inside ? "in gamut" : "out of gamut");
  return 0;
}

}  // namespace tool
