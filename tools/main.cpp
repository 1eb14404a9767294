// tintwell: the command-line way into the colour-management plugin. Every job is done
// through the plugin's registered classes and methods, via the host runtime.
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>
#include <vector>

#include "commands.h"
#include "session.h"

namespace {

constexpr int kExitFailure = 1;
constexpr int kExitUsage = 2;

void PrintUsage(std::FILE* to) {
  std::fputs(
      "usage: tintwell [OPTIONS] COMMAND [ARGS]\n"
      "\n"
      "Commands:\n"
      "  info [PROFILE...]            header fields of each profile and whether it is valid\n"
      "  convert SRC DST [VALUE...]   convert colours from SRC's colour space to DST's; with\n"
      "                               no values, reads one colour a line from standard input\n"
      "  gamut PROFILE L a b          whether a Lab colour lies inside PROFILE's gamut\n"
      "  list                         the classes and global methods the plugin registers\n"
      "  tags PROFILE                 every tag: index, signature, type, offset and size in\n"
      "                               the file, and the tags whose data it shares\n"
      "  tag PROFILE SIG              one tag decoded: a curve's entries or gamma, an XYZ,\n"
      "                               a text or description, a named-colour list, a lut's\n"
      "                               channels, grid, matrix and table sizes (with --json,\n"
      "                               every value: the file --lut-from takes)\n"
      "  edit PROFILE EDIT... [-o OUT]  change tags, then save the profile (to OUT if given)\n"
      "  embed IMAGE PROFILE -o OUT [--replace]\n"
      "                               write OUT: the PNG, JPEG or TIFF IMAGE with PROFILE\n"
      "                               embedded, its pixel data copied unchanged; an image\n"
      "                               that carries a profile needs --replace\n"
      "  extract IMAGE -o OUT.icc     write the profile that IMAGE carries to OUT.icc\n"
      "  picture SRC DST IN OUT       convert a PNG or JPEG image from SRC to DST (both RGB;\n"
      "                               SRC 'embedded' takes IN's own profile, else sRGB) and\n"
      "                               write OUT (.png or .jpg) with DST embedded\n"
      "  search [CRITERIA]            the profiles in the colour directory whose header\n"
      "                               holds every criterion given, with class and description\n"
      "  link OUT P1 P2 [P3 P4]       write the device link of the chain P1..P4 to OUT\n"
      "  blank OUT                    write a blank RGB display profile to OUT\n"
      "  copy SRC OUT                 copy the profile SRC to OUT\n"
      "\n"
      "A PROFILE is a file, or one of the built-in profiles:\n",
      to);
  for (const tool::BuiltinProfile& b : tool::BuiltinProfiles()) std::fprintf(to, "  %-8s %s\n", b.name, b.description);
  std::fputs(
      "\n"
      "Colour values, by the profile's colour space: RGB 0-255; CMYK, XYZ, Yxy, HSV,\n"
      "HLS 0-1; gray 0 (white) to 1 (black); Lab and Luv L 0-100 with a, b (u, v)\n"
      "from -128 to under 128; 5-8 channels whole numbers 0-255; a named-colour\n"
      "profile takes indexes from 1. Other values are refused.\n"
      "\n"
      "Options:\n"
      "  --intent N      rendering intent of source and destination, or of every\n"
      "                  profile of a link (0 perceptual, 1 relative colorimetric,\n"
      "                  2 saturation, 3 absolute colorimetric)\n"
      "  --via PROFILE   a profile between source and destination (up to two)\n"
      "  --json          machine-readable output\n"
      "  --raw           tag: the tag's bytes as a hex dump\n"
      "  --verbose       on failure, also show the plugin's trace\n"
      "  --plugin PATH   the plugin to load (default: $TINTWELL_PLUGIN, else\n"
      "                  ../lib/libtintwell.so beside this program)\n"
      "  -h, --help      this help\n"
      "\n"
      "Edits (edit command), applied in the order given:\n"
      "  --desc TEXT          the description ('desc' tag)\n"
      "  --copyright TEXT     the copyright ('cprt' tag)\n"
      "  --remove SIG         remove a tag (may be repeated)\n"
      "  --copy-tag NEW=SIG   make tag NEW share the data of tag SIG (may be repeated)\n"
      "  --lut-from FILE SIG  write tag SIG as the lut (mft1 or mft2) in FILE, a JSON\n"
      "                       object as 'tag --json' prints it: type, inputChannels,\n"
      "                       outputChannels, gridPoints, matrix (9 numbers, row by row),\n"
      "                       inCurve, lut and outCurve (whole numbers, 0-255 in mft1,\n"
      "                       0-65535 in mft2)\n"
      "  -o OUT               save the edited profile as OUT; without it the profile's\n"
      "                       own file is replaced\n"
      "A tag signature of fewer than 4 characters is padded with spaces ('XYZ').\n"
      "\n"
      "Search criteria (search command), signatures padded as tags are:\n"
      "  --cmm X  --class X  --space X  --pcs X  --manufacturer X   header signatures\n"
      "  --model N            the device model, a whole number above 0\n"
      "The colour directory is $XDG_DATA_HOME/icc (default ~/.local/share/icc).\n"
      "\n"
      "Exit status: 0 success, 1 a failed job, 2 a usage error.\n",
      to);
}

std::string DefaultPluginPath() {
  if (const char* env = std::getenv("TINTWELL_PLUGIN"); env && *env) return env;
  char exe[PATH_MAX];
  const ssize_t n = readlink("/proc/self/exe", exe, sizeof exe - 1);
  if (n <= 0) return "libtintwell.so";
  std::string dir(exe, static_cast<std::size_t>(n));
  dir.erase(dir.rfind('/'));
  return dir + "/../lib/libtintwell.so";
}

// Negative values look like options: anything strtod reads whole ("-1", "-.5", "-inf")
// is a value, and the command judges its range.
bool IsNumber(const std::string& word) {
  char* end = nullptr;
  std::strtod(word.c_str(), &end);
  return end == word.c_str() + word.size();
}

int Usage(const std::string& message) {
  std::fprintf(stderr, "tintwell: %s\n(see tintwell --help)\n", message.c_str());
  return kExitUsage;
}

}  // namespace

int main(int argc, char** argv) {
  tool::Options options;
  std::string pluginPath = DefaultPluginPath();
  bool verbose = false;
  bool searchGiven = false;
  std::vector<std::string> words;
  for (int i = 1; i < argc; ++i) {
    const std::string arg = argv[i];
    if (arg == "-h" || arg == "--help") {
      PrintUsage(stdout);
      return 0;
    } else if (arg == "--json") {
      options.json = true;
    } else if (arg == "--raw") {
      options.raw = true;
    } else if (arg == "--desc" || arg == "--copyright" || arg == "--remove" || arg == "--copy-tag" || arg == "-o") {
      if (i + 1 >= argc) return Usage(arg + " needs a value");
      const std::string v = argv[++i];
      if (arg == "-o") options.output = v;
      if (arg == "--desc") options.edits.push_back({tool::Edit::Description, v, ""});
      if (arg == "--copyright") options.edits.push_back({tool::Edit::Copyright, v, ""});
      if (arg == "--remove") options.edits.push_back({tool::Edit::Remove, v, ""});
      if (arg == "--copy-tag") options.edits.push_back({tool::Edit::CopyTag, v, ""});
    } else if (arg == "--lut-from") {
      if (i + 2 >= argc) return Usage("--lut-from needs a JSON file and a tag signature");
      options.edits.push_back({tool::Edit::LutFrom, argv[i + 1], argv[i + 2]});
      i += 2;
    } else if (arg == "--replace") {
      options.replace = true;
    } else if (arg == "--cmm" || arg == "--class" || arg == "--space" || arg == "--pcs" || arg == "--manufacturer" ||
               arg == "--model") {
      if (i + 1 >= argc) return Usage(arg + " needs a value");
      const std::string v = argv[++i];
      if (arg == "--model") {
        char* end = nullptr;
        const long model = std::strtol(v.c_str(), &end, 10);
        if (v.empty() || *end != '\0' || model < 1 || model > INT_MAX) return Usage("--model takes a whole number above 0");
        options.search.model = static_cast<int>(model);
        searchGiven = true;
        continue;
      }
      bool printable = !v.empty() && v.size() <= 4;
      for (unsigned char c : v) printable = printable && c >= 0x20 && c < 0x7F;
      if (!printable) return Usage(arg + " takes a signature of 1 to 4 printable characters");
      const std::string padded = v + std::string(4 - v.size(), ' ');
      if (arg == "--cmm") options.search.cmm = padded;
      if (arg == "--class") options.search.deviceClass = padded;
      if (arg == "--space") options.search.space = padded;
      if (arg == "--pcs") options.search.pcs = padded;
      if (arg == "--manufacturer") options.search.manufacturer = padded;
      searchGiven = true;
    } else if (arg == "--verbose") {
      verbose = true;
    } else if (arg == "--plugin" || arg == "--via" || arg == "--intent") {
      if (i + 1 >= argc) return Usage(arg + " needs a value");
      const char* v = argv[++i];
      if (arg == "--plugin") pluginPath = v;
      if (arg == "--via") options.via.push_back(v);
      if (arg == "--intent") {
        char* end = nullptr;
        const long intent = std::strtol(v, &end, 10);
        if (*v == '\0' || *end != '\0' || intent < 0 || intent > 3) return Usage("--intent takes 0, 1, 2 or 3");
        options.intent = static_cast<int>(intent);
      }
    } else if (arg.size() > 1 && arg[0] == '-' && !IsNumber(arg)) {
      return Usage("unknown option " + arg);
    } else {
      words.push_back(arg);
    }
  }
  if (words.empty()) return Usage("no command given");
  const std::string command = words.front();
  const std::vector<std::string> args(words.begin() + 1, words.end());
  static const char* const kCommands[] = {"info", "convert", "gamut", "list",   "tags",  "tag",  "edit",
                                          "embed", "extract", "picture", "search", "link", "blank", "copy"};
  if (std::find(std::begin(kCommands), std::end(kCommands), command) == std::end(kCommands))
    return Usage("unknown command " + command);
  if (options.raw && command != "tag") return Usage("--raw belongs to the tag command");
  if (!options.edits.empty() && command != "edit")
    return Usage("--desc, --copyright, --remove, --copy-tag and --lut-from belong to the edit command");
  if (!options.output.empty() && command != "edit" && command != "embed" && command != "extract")
    return Usage("-o belongs to the edit command, and to embed and extract");
  if (options.replace && command != "embed") return Usage("--replace belongs to the embed command");
  if (searchGiven && command != "search")
    return Usage("--cmm, --class, --space, --pcs, --manufacturer and --model belong to the search command");

  std::unique_ptr<tool::Session> session;
  try {
    session = std::make_unique<tool::Session>(pluginPath, verbose);
    if (command == "info") return tool::InfoCommand(*session, args, options);
    if (command == "convert") return tool::ConvertCommand(*session, args, options, stdin);
    if (command == "gamut") return tool::GamutCommand(*session, args, options);
    if (command == "tags") return tool::TagsCommand(*session, args, options);
    if (command == "tag") return tool::TagCommand(*session, args, options);
    if (command == "edit") return tool::EditCommand(*session, args, options);
    if (command == "embed") return tool::EmbedCommand(*session, args, options);
    if (command == "extract") return tool::ExtractCommand(*session, args, options);
    if (command == "picture") return tool::PictureCommand(*session, args, options);
    if (command == "search") return tool::SearchCommand(*session, args, options);
    if (command == "link") return tool::LinkCommand(*session, args, options);
    if (command == "blank") return tool::BlankCommand(*session, args, options);
    if (command == "copy") return tool::CopyCommand(*session, args, options);
    return tool::ListCommand(*session, args, options);
  } catch (const tool::UsageError& e) {
    return Usage(e.what());
  } catch (const tool::JobError& e) {
    std::fflush(stdout);
    if (e.code() != 0)
      std::fprintf(stderr, "tintwell: %s (CMError %d)\n", e.what(), e.code());
    else
      std::fprintf(stderr, "tintwell: %s\n", e.what());
    if (verbose && session)
      for (const std::string& line : session->TakeTraces()) std::fprintf(stderr, "  trace: %s\n", line.c_str());
    return kExitFailure;
  } catch (const std::exception& e) {
    std::fflush(stdout);
    std::fprintf(stderr, "tintwell: %s\n", e.what());
    return kExitFailure;
  }
}
