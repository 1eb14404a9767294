// The tool's commands. Each works through the plugin's classes via the host.
#ifndef TINTWELL_TOOLS_COMMANDS_H
#define TINTWELL_TOOLS_COMMANDS_H

#include <cstdio>
#include <string>
#include <vector>

#include "session.h"

namespace tool {

// One change the edit command makes, in the order given.
struct Edit {
  enum Kind { Description, Copyright, Remove, CopyTag, LutFrom } kind;
  std::string value;  // the text, the tag to remove, NEW=EXISTING, or the lut's JSON file
  std::string tag;    // LutFrom: the tag to write
};

// search: the header values a profile must hold; empty (or a model of 0) is no criterion.
struct SearchCriteria {
  std::string cmm, deviceClass, space, pcs, manufacturer;
  int model = 0;
};

struct Options {
  bool json = false;
  int intent = -1;                // rendering intent for source and destination; -1 keeps theirs
  std::vector<std::string> via;   // up to two profiles between source and destination
  bool raw = false;               // tag: the bytes as a hex dump
  std::vector<Edit> edits;        // edit: the changes
  std::string output;             // edit: save here instead of in place; embed, extract: the file made
  bool replace = false;           // embed: replace a profile the image already carries
  SearchCriteria search;          // search: the criteria
};

int ListCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int InfoCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int ConvertCommand(Session& session, const std::vector<std::string>& args, const Options& options, std::FILE* input);
int GamutCommand(Session& session, const std::vector<std::string>& args, const Options& options);
// Tag listing, one tag decoded, and tag edits: tools/tag_commands.cpp
int TagsCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int TagCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int EditCommand(Session& session, const std::vector<std::string>& args, const Options& options);
// Profiles in image files: tools/image_commands.cpp
int EmbedCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int ExtractCommand(Session& session, const std::vector<std::string>& args, const Options& options);
// An image file through a colour world: tools/picture_command.cpp
int PictureCommand(Session& session, const std::vector<std::string>& args, const Options& options);
// Finding and making profiles: tools/discovery_commands.cpp
int SearchCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int LinkCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int BlankCommand(Session& session, const std::vector<std::string>& args, const Options& options);
int CopyCommand(Session& session, const std::vector<std::string>& args, const Options& options);

}  // namespace tool

#endif
