#include "color_values.h"

#include <cmath>
#include <cstdint>

#include "session.h"

namespace tool {

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
    case ColorAccess::Kind::Named:  // an unsigned index in the Integer's 32 bits
      rt.Set(color, "namedindex", static_cast<int>(static_cast<std::uint32_t>(values[0])));
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
      values.push_back(static_cast<std::uint32_t>(rt.Get(color, "namedindex").AsInteger()));
      break;
  }
  return values;
}

}  // namespace tool
