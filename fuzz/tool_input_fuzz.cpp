// Fuzz target for the tool's colour input: the first byte picks a colour space, the rest
// is read as standard input would be, then as single values. Whatever is accepted must
// be a colour the plugin can store unwrapped: one finite value in range per channel.
#include <cctype>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "input_parse.h"

namespace {

void Check(bool condition) {
  if (!condition) std::abort();
}

const char* const kSpaces[] = {"RGB ", "CMYK", "GRAY", "XYZ ", "Yxy ", "Lab ", "Luv ", "HSV ",
                               "HLS ", "3CLR", "5CLR", "6CLR", "7CLR", "8CLR", ""};

tool::ColorAccess AccessFor(std::uint8_t pick) {
  const std::size_t n = sizeof kSpaces / sizeof kSpaces[0];
  const char* space = kSpaces[pick % n];
  return *space ? tool::AccessForSpace(space) : tool::NamedColorAccess();
}

void CheckInside(double v, const tool::ChannelRange& c) {
  Check(std::isfinite(v));
  Check(v >= c.low && (c.highIncluded ? v <= c.high : v < c.high));
  if (c.whole) Check(std::floor(v) == v);
}

// A refusal names the channel and its range.
void CheckRefusal(const tool::UsageError& e, const tool::ChannelRange& c) {
  const std::string what = e.what();
  Check(what.compare(0, c.label.size(), c.label) == 0);
  Check(what.find(tool::RangeText(c)) != std::string::npos);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const tool::ColorAccess access = AccessFor(data[0]);
  Check(!access.channels.empty() && access.channels.size() == access.names.size());
  const std::string text(reinterpret_cast<const char*>(data + 1), size - 1);

  // Lines: read back whole, joined they give the input again (less a final '\n').
  if (!text.empty()) {
    std::FILE* in = fmemopen(const_cast<char*>(text.data()), text.size(), "r");
    Check(in != nullptr);
    std::string line, joined;
    std::size_t lines = 0;
    while (tool::ReadLine(in, line)) {
      joined += (lines++ ? "\n" : "") + line;
      Check(line.find('\n') == std::string::npos);
    }
    Check(joined + (text.back() == '\n' ? "\n" : "") == text);

    // Colours: as many as non-blank lines at most, each with one value a channel.
    std::rewind(in);
    try {
      const auto colors = tool::ReadColors(in, access);
      Check(colors.size() <= lines);
      for (const auto& color : colors) {
        Check(color.size() == access.channels.size());
        for (std::size_t i = 0; i < color.size(); ++i) CheckInside(color[i], access.channels[i]);
      }
    } catch (const tool::UsageError& e) {
      Check(std::string(e.what()).compare(0, 5, "line ") == 0);
    }
    std::fclose(in);
  }

  // Words: none empty or holding a blank; together they keep every byte that is not a
  // blank, less at most one comma for each blank-separated run.
  std::size_t kept = 0;
  for (const std::string& w : tool::SplitWords(text)) {
    Check(!w.empty());
    for (char ch : w) Check(!std::isspace(static_cast<unsigned char>(ch)));
    kept += w.size();
  }
  std::size_t nonBlank = 0, runs = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (std::isspace(static_cast<unsigned char>(text[i]))) continue;
    ++nonBlank;
    if (i == 0 || std::isspace(static_cast<unsigned char>(text[i - 1]))) ++runs;
  }
  Check(kept <= nonBlank && nonBlank - kept <= runs);

  // The whole text as one value, against every channel of the space.
  for (const tool::ChannelRange& c : access.channels) {
    try {
      CheckInside(tool::ParseValue(text, c), c);
    } catch (const tool::UsageError& e) {
      CheckRefusal(e, c);
    }
  }
  return 0;
}
