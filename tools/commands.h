// The tool's commands. Each works through the plugin's classes via the host.
#ifndef TINTWELL_TOOLS_COMMANDS_H
#define TINTWELL_TOOLS_COMMANDS_H

#include <cstdio>
#include <string>
#include <vector>

#include "session.h"

namespace tool {

struct Options {
  bool json = false;
  int intent = -1;                // rendering intent for source and destination; -1 keeps theirs
  std::vector<std::string> via;   // up to two profiles between source and destination
};

int ListCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int InfoCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int ConvertCommand(Session& session, const std::vector<std::string>& args, const Options& options, std::FILE* input);
int GamutCommand(Session& session, const std::vector<std::string>& args, const Options& options);

}  // namespace tool

#endif
