// A small JSON reader for the files the tool takes in (a lut dumped by --json and edited
// by hand). Bounded: the nesting depth and the text's size are capped, so a hostile file
// costs at most memory in proportion to its size and a fixed stack.
#ifndef TINTWELL_TOOLS_JSON_READ_H
#define TINTWELL_TOOLS_JSON_READ_H

#include <cstddef>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

namespace tool {

// Malformed text: the message names the line and column of the fault.
class JsonError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

struct JsonValue {
  enum class Kind { Null, Boolean, Number, String, Array, Object } kind = Kind::Null;
  bool boolean = false;
  double number = 0;
  std::string text;
  std::vector<JsonValue> items;
  std::map<std::string, JsonValue> members;  // a repeated key is refused
};

constexpr std::size_t kJsonMaxDepth = 32;
constexpr std::size_t kJsonMaxBytes = 64u << 20;

// The one value text holds, with nothing but white space around it. Throws JsonError.
JsonValue ParseJson(const std::string& text);

}  // namespace tool

#endif
