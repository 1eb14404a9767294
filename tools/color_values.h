// How a script reads and writes a CMColor in a profile's colour space: the accessors
// whose setters record that space's colour type, and the ranges they speak.
#ifndef TINTWELL_TOOLS_COLOR_VALUES_H
#define TINTWELL_TOOLS_COLOR_VALUES_H

#include <string>
#include <vector>

#include "host/runtime.h"

namespace tool {

struct ColorAccess {
  enum class Kind { Properties, Xyz, Channels, Named } kind = Kind::Properties;
  std::vector<std::string> names;  // property names, or component labels
  std::string range;               // for help and messages
};

// The accessors for an ICC data colour space signature as the ColorSpace property
// reads it ("RGB ", "CMYK", "Lab ", ...).
ColorAccess AccessForSpace(const std::string& space);
// The accessor for the colour indexes a named-colour profile takes in.
ColorAccess NamedColorAccess();

void WriteColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access,
                const std::vector<double>& values);
std::vector<double> ReadColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access);

}  // namespace tool

#endif
