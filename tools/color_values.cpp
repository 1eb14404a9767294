#include "color_values.h"

#include <cmath>

#include "session.h"

namespace tool {

ColorAccess AccessForSpace(const std::string& space) {
  using Kind = ColorAccess::Kind;
  if (space == "GRAY") return {Kind::Properties, {"gray"}, "gray 0 (white) to 1 (black)"};
  if (space == "XYZ ") return {Kind::Xyz, {"X", "Y", "Z"}, "X Y Z 0-1"};
  if (space == "Yxy ") return {Kind::Properties, {"ycapy", "yx", "yy"}, "Y x y 0-1"};
  if (space == "Lab ") return {Kind::Properties, {"ll", "la", "lb"}, "L 0-100, a b -128-128"};
  if (space == "Luv ") return {Kind::Properties, {"luvl", "luvu", "luvv"}, "L 0-100, u v -128-128"};
  if (space == "HSV ") return {Kind::Properties, {"hsvh", "hsvs", "hsvv"}, "H S V 0-1"};
  if (space == "HLS " || space == "YCbr" || space == "CMY " || space == "3CLR")
    return {Kind::Properties, {"hlsh", "hlsl", "hlss"}, "three channels 0-1"};
  if (space == "CMYK" || space == "4CLR") return {Kind::Properties, {"cc", "cm", "cy", "ck"}, "C M Y K 0-1"};
  for (int n = 5; n <= 8; ++n)
    if (space == std::to_string(n) + "CLR") {
      ColorAccess a{Kind::Channels, {}, std::to_string(n) + " channels 0-255"};
      for (int i = 1; i <= n; ++i) a.names.push_back(std::to_string(i));
      return a;
    }
  return {Kind::Properties, {"rr", "rg", "rb"}, "R G B 0-255"};
}

ColorAccess NamedColorAccess() { return {ColorAccess::Kind::Named, {"index"}, "named-colour index from 1"}; }

namespace {
const char* ChannelMethod(std::size_t channels, bool set) {
  static const char* const kGet[] = {"getfive", "getsix", "getseven", "geteight"};
  static const char* const kSet[] = {"setfive", "setsix", "setseven", "seteight"};
  return (set ? kSet : kGet)[channels - 5];
}
}  // namespace

void WriteColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access,
                const std::vector<double>& values) {
  if (values.size() != access.names.size())
    throw UsageError("expected " + std::to_string(access.names.size()) + " components (" + access.range + "), got " +
                     std::to_string(values.size()));
  switch (access.kind) {
    case ColorAccess::Kind::Properties:
      for (std::size_t i = 0; i < values.size(); ++i) rt.Set(color, access.names[i], values[i]);
      break;
    case ColorAccess::Kind::Xyz:
      rt.Call(color, "setxyz", {values[0], values[1], values[2]});
      break;
    case ColorAccess::Kind::Channels:
      for (std::size_t i = 0; i < values.size(); ++i)
        rt.Call(color, ChannelMethod(values.size(), true),
                {static_cast<int>(i + 1), static_cast<int>(std::lround(values[i]))});
      break;
    case ColorAccess::Kind::Named:
      rt.Set(color, "namedindex", static_cast<int>(std::lround(values[0])));
      break;
  }
}

std::vector<double> ReadColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access) {
  std::vector<double> values;
  switch (access.kind) {
    case ColorAccess::Kind::Properties:
      for (const std::string& name : access.names) values.push_back(rt.Get(color, name).AsDouble());
      break;
    case ColorAccess::Kind::Xyz: {
      host::Value x, y, z;
      rt.Call(color, "getxyz", {host::ByRef(x), host::ByRef(y), host::ByRef(z)});
      values = {x.AsDouble(), y.AsDouble(), z.AsDouble()};
      break;
    }
    case ColorAccess::Kind::Channels:
      for (std::size_t i = 0; i < access.names.size(); ++i)
        values.push_back(rt.Call(color, ChannelMethod(access.names.size(), false), {static_cast<int>(i + 1)}).AsInteger());
      break;
    case ColorAccess::Kind::Named:
      values.push_back(rt.Get(color, "namedindex").AsInteger());
      break;
  }
  return values;
}

}  // namespace tool
