// embed and extract: profiles in PNG, JPEG and TIFF files, through the plugin's
// EmbedImage and GetImageProfile.
#include <unistd.h>

#include "commands.h"

namespace tool {

namespace {

constexpr int kNotAnImage = -30, kNoImageSupport = -31, kHasProfile = -32, kNotEmbedded = -33;

std::string Why(int code, const std::string& image) {
  switch (code) {
    case kNotAnImage: return image + " is not a readable PNG, JPEG or TIFF image";
    case kNoImageSupport: return "this plugin was built without image files";
    case kHasProfile: return image + " already carries a profile (--replace replaces it)";
    case kNotEmbedded: return "cannot embed the profile in " + image + " (image data incomplete, or the profile does not fit the image)";
    default: return "cannot write the image";
  }
}

}  // namespace

int EmbedCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 2 || options.output.empty()) throw UsageError("embed takes IMAGE PROFILE -o OUT");
  host::Runtime& rt = session.rt();
  if (access(args[0].c_str(), R_OK) != 0) throw JobError("cannot read " + args[0], 0);
  host::Object profile = session.OpenProfile(args[1]);
  const bool done = rt.CallGlobal("EmbedImage", {rt.MakeFolderItem(args[0]), rt.MakeFolderItem(options.output),
                                                 options.replace, profile})
                        .AsBoolean();
  if (!done) {
    const int code = session.LastError();
    throw JobError(Why(code, args[0]), code);
  }
  return 0;
}

int ExtractCommand(Session& session, const std::vector<std::string>& args, const Options& options) {
  if (args.size() != 1 || options.output.empty()) throw UsageError("extract takes IMAGE -o OUT.icc");
  host::Runtime& rt = session.rt();
  if (access(args[0].c_str(), R_OK) != 0) throw JobError("cannot read " + args[0], 0);
  const host::Value got = rt.CallGlobal("GetImageProfile", {rt.MakeFolderItem(args[0]), 1});
  if (got.IsNil()) {
    const int code = session.LastError();
    if (code != 0) throw JobError(Why(code, args[0]), code);
    throw JobError(args[0] + " carries no profile", 0);
  }
  rt.Call(got.AsObject(), "SaveProfileAs", {rt.MakeFolderItem(options.output)});
  session.Check("cannot write " + options.output);
  return 0;
}

}  // namespace tool
