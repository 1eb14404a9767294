// One scripted session with the plugin, run by two hosts: the Windows test host under
// Wine (the plugin on Wine's colour management) and the project's host on Linux (the
// plugin on the stand-in layer). Both write the same report; cross_check.py compares them.
//
// A Host offers: NewDebugger() (a registered debugger whose events land in Traces()),
// OpenProfile(path), NewColorWorld(a, b), NewColor(), SetDouble, GetDouble, GetInteger,
// GetString (by property name), GetLocationName (the file name of a Folderitem
// property), Match(world, color), Error() (CMError), Release(object),
// Unregister() (halvoUnregisterDebugger) and the live object and string counts.
#ifndef TINTWELL_TESTS_WINDOWS_CROSS_CHECK_H
#define TINTWELL_TESTS_WINDOWS_CROSS_CHECK_H

#include <cstdio>
#include <string>
#include <vector>

namespace cross_check {

// Steps the Wine implementation leaves as stubs: the session does not take them.
inline const char* const kSkipped[] = {"CheckColors", "SetColorProfileElementSize", "CreateDeviceLinkProfile"};

// A trace with any Windows path in it cut to "<path>": the two hosts keep their files
// in different places.
inline std::string WithoutPaths(const std::string& text) {
  const std::size_t drive = text.find(":\\");
  if (drive == std::string::npos || drive == 0) return text;
  return text.substr(0, drive - 1) + "<path>";
}

template <class Host>
int Run(Host& host, const std::string& srgbPath, const std::string& labPath, std::FILE* out) {
  const std::size_t objects = host.LiveObjects();
  const std::size_t strings = host.LiveStrings();
  for (const char* step : kSkipped) std::fprintf(out, "skipped %s (a stub under Wine)\n", step);

  auto debugger = host.NewDebugger();
  auto srgb = host.OpenProfile(srgbPath);
  std::fprintf(out, "open srgb error %d\n", host.Error());
  auto lab = host.OpenProfile(labPath);
  std::fprintf(out, "open lab error %d\n", host.Error());

  struct Profile {
    const char* name;
    decltype(srgb)* object;
  } profiles[] = {{"srgb", &srgb}, {"lab", &lab}};
  for (const auto& p : profiles) {
    std::fprintf(out, "%s Location '%s'\n", p.name, host.GetLocationName(*p.object, "Location").c_str());
    for (const char* field : {"ColorSpace", "ConnectionSpace", "Signature", "Platform", "CMM", "Type"})
      std::fprintf(out, "%s %s '%s'\n", p.name, field, host.GetString(*p.object, field).c_str());
    for (const char* field : {"Version", "RenderIntent", "Flags", "TagCount", "Size"})
      std::fprintf(out, "%s %s %d\n", p.name, field, host.GetInteger(*p.object, field));
    for (const char* field : {"WhiteX", "WhiteY", "WhiteZ"})
      std::fprintf(out, "%s %s %.4f\n", p.name, field, host.GetDouble(*p.object, field));
  }

  // A profile that is not there, just before the colour world: Windows (and Wine) keep a
  // failure's code across later successful calls, so the world must still report 0.
  auto missing = host.OpenProfile(srgbPath + ".missing");
  std::fprintf(out, "open missing error %d\n", host.Error());
  auto world = host.NewColorWorld(srgb, lab);
  std::fprintf(out, "colorworld error %d\n", host.Error());
  const double inputs[][3] = {{255, 255, 255}, {255, 0, 0},   {0, 255, 0},   {0, 0, 255},
                              {0, 0, 0},       {64, 64, 64},  {128, 128, 128}, {192, 192, 192}};
  for (const auto& rgb : inputs) {
    auto color = host.NewColor();
    host.SetDouble(color, "rr", rgb[0]);
    host.SetDouble(color, "rg", rgb[1]);
    host.SetDouble(color, "rb", rgb[2]);
    host.Match(world, color);
    std::fprintf(out, "lab %g %g %g -> %.4f %.4f %.4f error %d\n", rgb[0], rgb[1], rgb[2],
                 host.GetDouble(color, "ll"), host.GetDouble(color, "la"), host.GetDouble(color, "lb"), host.Error());
    host.Release(color);
  }

  host.Release(world);
  host.Release(lab);
  host.Release(srgb);

  host.Release(missing);
  host.Unregister();
  host.Release(debugger);

  for (const std::string& t : host.Traces()) std::fprintf(out, "trace %s\n", WithoutPaths(t).c_str());
  const bool balanced = host.LiveObjects() == objects && host.LiveStrings() == strings;
  std::fprintf(out, "live objects %zu strings %zu\n", host.LiveObjects() - objects, host.LiveStrings() - strings);
  return balanced ? 0 : 1;
}

}  // namespace cross_check

#endif
