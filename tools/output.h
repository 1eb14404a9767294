// Text and JSON output of the tool's results.
#ifndef TINTWELL_TOOLS_OUTPUT_H
#define TINTWELL_TOOLS_OUTPUT_H

#include <string>

namespace tool {

// A signature or other plugin text shown safely: bytes outside printable ASCII as \xNN.
std::string Printable(const std::string& text);
// A JSON string literal, quotes included.
std::string JsonString(const std::string& text);
// A number with up to 4 decimals, trailing zeros dropped.
std::string Number(double value);

}  // namespace tool

#endif
