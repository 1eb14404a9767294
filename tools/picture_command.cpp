// tintwell picture: an image file converted through a colour world with MatchPicture.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>

#include "commands.h"
#include "image_io.h"

namespace tool {

namespace {

// Above this many pixels the command says on stderr what it is doing.
constexpr long long kProgressPixels = 4000000;

std::vector<std::uint8_t> ReadFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) throw JobError("cannot read " + path, 0);
  return std::vector<std::uint8_t>(std::istreambuf_iterator<char>(in), {});
}

// The profile embedded in the input as an open Profile, or nil with a warning when it
// cannot serve as the source of an RGB picture.
host::Object EmbeddedProfile(Session& session, const std::vector<std::uint8_t>& icc, const std::string& input) {
  const char* dir = std::getenv("TMPDIR");
  std::string path = std::string(dir && *dir ? dir : "/tmp") + "/tintwell-embedded-XXXXXX";
  const int fd = mkstemp(path.data());
  if (fd < 0) throw JobError("cannot make a temporary file for the embedded profile", 0);
  const bool written = write(fd, icc.data(), icc.size()) == static_cast<ssize_t>(icc.size());
  close(fd);
  host::Object profile;
  try {
    // The profile works on its own copy: the file can go at once.
    if (written) profile = session.OpenProfile(path);
  } catch (const JobError&) {
  }
  unlink(path.c_str());
  if (!profile) {
    std::fprintf(stderr, "tintwell: warning: %s: the embedded profile is not usable; taking sRGB\n", input.c_str());
  } else if (session.rt().Get(profile, "ColorSpace").AsString() != "RGB ") {
    std::fprintf(stderr, "tintwell: warning: %s: the embedded profile is not an RGB profile; taking sRGB\n",
                 input.c_str());
    profile = host::Object();
  }
  return profile;
}

void RequireRgb(Session& session, const host::Object& profile, const std::string& name, const char* role) {
  if (session.rt().Get(profile, "ColorSpace").AsString() != "RGB ")
    throw JobError(std::string(role) + " " + name +
                       " is not an RGB profile: pictures go from RGB to RGB (give other profiles with --via)",
                   0);
}

}  // namespace

int PictureCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 4) throw UsageError("picture needs SRC DST IN OUT");
  if (options.via.size() > 2) throw UsageError("at most two --via profiles");
  const std::string &srcName = args[0], &dstName = args[1], &input = args[2], &output = args[3];
  ImageFormat format;
  if (!FormatFromName(output, &format)) throw UsageError("OUT must end in .png, .jpg or .jpeg: " + output);
  host::Runtime& rt = session.rt();

  // Profiles first: a wrong name is found before a large image is read.
  host::Object dst = session.OpenProfile(dstName);
  RequireRgb(session, dst, dstName, "destination");
  const bool embedded = srcName == "embedded";
  host::Object src;
  if (!embedded) {
    src = session.OpenProfile(srcName);
    RequireRgb(session, src, srcName, "source");
  }
  std::vector<host::Object> via;
  for (const std::string& v : options.via) via.push_back(session.OpenProfile(v));

  ImageExtras extras;
  host::Object picture = ReadImage(rt, input, &extras);
  const bool big = static_cast<long long>(extras.width) * extras.height > kProgressPixels;
  if (big)
    std::fprintf(stderr, "tintwell: %s: %d x %d (%.1f megapixels) read\n", input.c_str(), extras.width, extras.height,
                 extras.width * static_cast<double>(extras.height) / 1e6);
  if (embedded) {
    if (!extras.icc.empty()) src = EmbeddedProfile(session, extras.icc, input);
    if (!src) src = session.OpenProfile("srgb");
  }
  if (options.intent >= 0) {
    rt.Set(src, "RenderIntent", options.intent);
    rt.Set(dst, "RenderIntent", options.intent);
  }
  host::Object world = session.NewColorWorld(src, dst, via);

  if (big) std::fprintf(stderr, "tintwell: converting\n");
  const host::Value result = rt.Call(world, "MatchPicture", {picture, extras.width, extras.height, 32, false});
  if (!result.IsObject()) throw JobError("the picture could not be converted", session.LastError());
  picture = host::Object();  // the source's pixels are no longer needed

  if (format == ImageFormat::Jpeg && extras.alpha)
    std::fprintf(stderr, "tintwell: warning: JPEG has no alpha channel; %s is written without it\n", output.c_str());
  if (big) std::fprintf(stderr, "tintwell: writing %s\n", output.c_str());
  ImageExtras written = extras;
  if (format == ImageFormat::Jpeg) written.alpha = false, written.depth = 8;
  WriteImage(rt, result.AsObject(), written, format, output, ReadFile(Session::ProfilePath(dstName)));
  return 0;
}

}  // namespace tool
