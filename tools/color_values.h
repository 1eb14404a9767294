// Writing and reading a CMColor through the accessors of a profile's colour space.
#ifndef TINTWELL_TOOLS_COLOR_VALUES_H
#define TINTWELL_TOOLS_COLOR_VALUES_H

#include <string>
#include <vector>

#include "host/runtime.h"
#include "input_parse.h"

namespace tool {

// Writes values that ParseColor accepted for access.
void WriteColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access,
                const std::vector<double>& values);
std::vector<double> ReadColor(host::Runtime& rt, const host::Object& color, const ColorAccess& access);

}  // namespace tool

#endif
