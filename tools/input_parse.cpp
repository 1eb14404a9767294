#include "input_parse.h"

#include <cctype>
#include <cmath>
#include <cstdlib>

#include "output.h"

namespace tool {

namespace {

// The ranges follow the plugin's words. RGB is stored as v × 257 and the unit ranges
// (CMYK, XYZ, Yxy, HSV, HLS, gray) as v × 65535 or (1 − v) × 65535, so both ends are
// words exactly. Lab L is stored as L × 652.8: the word would hold up to 100.39, but no
// lightness lies beyond 100. Luv L is L × 655.35, 100 the top word.
ChannelRange Unit(const char* label) { return {label, 0, 1}; }
ChannelRange Rgb(const char* label) { return {label, 0, 255}; }
ChannelRange Lightness() { return {"L", 0, 100}; }
// a, b (u, v) are stored as (v + 128) × 256: -128 is word 0, 127.996 the top word, and
// 128 would be 65536, which wraps to -128. Every value below 128 truncates onto a word
// of at most 0xFFFF, so the range is -128 up to but not including 128: nothing inside
// it wraps, and 128 itself is refused rather than quietly stored as 127.996.
ChannelRange Signed(const char* label) { return {label, -128, 128, false}; }
// Five to eight channels are single bytes set from an Integer: a fraction would be
// rounded away, so only whole numbers.
ChannelRange Byte(const std::string& label) { return {label, 0, 255, true, true}; }

ColorAccess Access(ColorAccess::Kind kind, std::vector<std::string> names, std::vector<ChannelRange> channels,
                   std::string range) {
  return {kind, std::move(names), std::move(channels), std::move(range)};
}

// The text as a message quotes it: printable, and short whatever the input.
std::string Quoted(const std::string& text) {
  constexpr std::size_t kShown = 40;
  if (text.size() <= kShown) return Printable(text);
  return Printable(text.substr(0, kShown)) + "...";
}

bool Blank(char c) { return std::isspace(static_cast<unsigned char>(c)) != 0; }

}  // namespace

ColorAccess AccessForSpace(const std::string& space) {
  using Kind = ColorAccess::Kind;
  const Kind P = Kind::Properties;
  if (space == "GRAY") return Access(P, {"gray"}, {Unit("gray")}, "gray 0 (white) to 1 (black)");
  if (space == "XYZ ") return Access(Kind::Xyz, {"X", "Y", "Z"}, {Unit("X"), Unit("Y"), Unit("Z")}, "X Y Z 0-1");
  if (space == "Yxy ")
    return Access(P, {"ycapy", "yx", "yy"}, {Unit("Y"), Unit("x"), Unit("y")}, "Y x y 0-1");
  if (space == "Lab ")
    return Access(P, {"ll", "la", "lb"}, {Lightness(), Signed("a"), Signed("b")}, "L 0-100, a b -128 to under 128");
  if (space == "Luv ")
    return Access(P, {"luvl", "luvu", "luvv"}, {Lightness(), Signed("u"), Signed("v")},
                  "L 0-100, u v -128 to under 128");
  if (space == "HSV ") return Access(P, {"hsvh", "hsvs", "hsvv"}, {Unit("H"), Unit("S"), Unit("V")}, "H S V 0-1");
  if (space == "HLS " || space == "YCbr" || space == "CMY " || space == "3CLR")
    return Access(P, {"hlsh", "hlsl", "hlss"}, {Unit("channel 1"), Unit("channel 2"), Unit("channel 3")},
                  "three channels 0-1");
  if (space == "CMYK" || space == "4CLR")
    return Access(P, {"cc", "cm", "cy", "ck"}, {Unit("C"), Unit("M"), Unit("Y"), Unit("K")}, "C M Y K 0-1");
  for (int n = 5; n <= 8; ++n)
    if (space == std::to_string(n) + "CLR") {
      ColorAccess a{Kind::Channels, {}, {}, std::to_string(n) + " channels, whole numbers 0-255"};
      for (int i = 1; i <= n; ++i) {
        a.names.push_back(std::to_string(i));
        a.channels.push_back(Byte("channel " + std::to_string(i)));
      }
      return a;
    }
  return Access(P, {"rr", "rg", "rb"}, {Rgb("R"), Rgb("G"), Rgb("B")}, "R G B 0-255");
}

// Indexes count from 1 and are stored as a 32-bit unsigned number.
ColorAccess NamedColorAccess() {
  return Access(ColorAccess::Kind::Named, {"index"}, {{"index", 1, 4294967295.0, true, true}},
                "named-colour index, a whole number from 1");
}

std::string RangeText(const ChannelRange& channel) {
  return Number(channel.low) + (channel.highIncluded ? " to " : " to under ") + Number(channel.high);
}

double ParseValue(const std::string& text, const ChannelRange& channel) {
  char* end = nullptr;
  const double v = std::strtod(text.c_str(), &end);
  // The whole text must be the number: no trailing bytes, an embedded NUL included.
  // Overflow gives an infinity and underflow a value near 0, so errno adds nothing.
  const bool number = !text.empty() && !Blank(text[0]) && end == text.c_str() + text.size();
  // Written so that NaN, which fails every comparison, falls outside.
  const bool inside = v >= channel.low && (channel.highIncluded ? v <= channel.high : v < channel.high) &&
                      (!channel.whole || std::floor(v) == v);
  if (!number || !inside)
    throw UsageError(channel.label + " must be a " + (channel.whole ? "whole " : "") + "number from " +
                     RangeText(channel) + ", not " + Quoted(text));
  return v;
}

std::vector<double> ParseColor(const std::vector<std::string>& words, const ColorAccess& access) {
  if (words.size() != access.channels.size())
    throw UsageError("expected " + std::to_string(access.channels.size()) + " values (" + access.range + "), got " +
                     std::to_string(words.size()));
  std::vector<double> values;
  for (std::size_t i = 0; i < words.size(); ++i) values.push_back(ParseValue(words[i], access.channels[i]));
  return values;
}

std::vector<std::string> SplitWords(const std::string& line) {
  std::vector<std::string> words;
  std::size_t i = 0;
  while (i < line.size()) {
    if (Blank(line[i])) {
      ++i;
      continue;
    }
    std::size_t end = i;
    while (end < line.size() && !Blank(line[end])) ++end;
    std::string word = line.substr(i, end - i);
    if (word.back() == ',') word.pop_back();
    if (!word.empty()) words.push_back(std::move(word));
    i = end;
  }
  return words;
}

bool ReadLine(std::FILE* in, std::string& line) {
  line.clear();
  int c;
  while ((c = std::getc(in)) != EOF) {
    if (c == '\n') return true;
    line += static_cast<char>(c);
  }
  return !line.empty();  // a last line without its '\n'
}

std::vector<std::vector<double>> ReadColors(std::FILE* in, const ColorAccess& access) {
  std::vector<std::vector<double>> colors;
  std::string line;
  for (unsigned long number = 1; ReadLine(in, line); ++number) {
    const std::vector<std::string> words = SplitWords(line);
    if (words.empty()) continue;
    try {
      colors.push_back(ParseColor(words, access));
    } catch (const UsageError& e) {
      throw UsageError("line " + std::to_string(number) + ": " + e.what());
    }
  }
  if (std::ferror(in)) throw std::runtime_error("cannot read the input");
  return colors;
}

}  // namespace tool
