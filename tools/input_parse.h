// What a colour's values may be on the command line and on input lines, and the parsing
// that refuses the rest. The plugin's CMColor stores whatever it is given by its store
// rule, wrapping what lies outside its words; the tool refuses such values first. None
// of this needs the plugin, so a fuzz target can drive it alone.
#ifndef TINTWELL_TOOLS_INPUT_PARSE_H
#define TINTWELL_TOOLS_INPUT_PARSE_H

#include <cstdio>
#include <stdexcept>
#include <string>
#include <vector>

namespace tool {

// A usage error: bad arguments or input.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// The values one channel takes: low <= v <= high, or low <= v < high where the plugin's
// word cannot hold high itself; whole numbers only where the plugin takes an integer.
struct ChannelRange {
  std::string label;  // for messages: "R", "L", "index"
  double low = 0, high = 0;
  bool highIncluded = true;
  bool whole = false;
};

// How a script reads and writes a CMColor in a profile's colour space: the accessors
// whose setters record that space's colour type, and the ranges they speak.
struct ColorAccess {
  enum class Kind { Properties, Xyz, Channels, Named } kind = Kind::Properties;
  std::vector<std::string> names;      // property names, or component labels
  std::vector<ChannelRange> channels;  // one for each name
  std::string range;                   // for help and messages
};

// The accessors for an ICC data colour space signature as the ColorSpace property
// reads it ("RGB ", "CMYK", "Lab ", ...).
ColorAccess AccessForSpace(const std::string& space);
// The accessor for the colour indexes a named-colour profile takes in.
ColorAccess NamedColorAccess();

// The channel's range as a message shows it: "0 to 255", "-128 to under 128".
std::string RangeText(const ChannelRange& channel);
// The number text spells (the whole of it), inside the channel's range. Anything else,
// NaN and infinity included, throws UsageError naming the text and the range.
double ParseValue(const std::string& text, const ChannelRange& channel);
// One colour from its words, exactly one for each channel of access.
std::vector<double> ParseColor(const std::vector<std::string>& words, const ColorAccess& access);
// The words of an input line: separated by blanks, each may end in one comma.
std::vector<std::string> SplitWords(const std::string& line);
// Reads one line of any length into line, without its '\n'; false at the end of input.
bool ReadLine(std::FILE* in, std::string& line);
// Every colour of the input, one a line, blank lines skipped. A bad line throws
// UsageError with its number; a read error throws std::runtime_error.
std::vector<std::vector<double>> ReadColors(std::FILE* in, const ColorAccess& access);

}  // namespace tool

#endif
