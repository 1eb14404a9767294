// Device links, blank and copied profiles through the host: the files they write, what
// Little CMS makes of them, and what a failure leaves behind (the old file, no object).
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <set>

#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using host::Value;

uint32_t BigEndian(const std::vector<char>& b, std::size_t at) {
  uint32_t v = 0;
  for (std::size_t i = 0; i < 4; ++i) v = v << 8 | static_cast<uint8_t>(b[at + i]);
  return v;
}

class NewProfilesTest : public PluginTest {
 protected:
  Object Open(const std::string& systemRelative, int intent) {
    const std::string path = files.Copy(systemRelative, "src" + std::to_string(sources_++) + ".icc");
    Object p = rt->New("Profile", {rt->MakeFolderItem(path)});
    rt->Set(p, "RenderIntent", intent);
    return p;
  }
  Value Link(const std::string& out, const Value& p1, const Value& p2, const Value& p3 = Value(),
             const Value& p4 = Value()) {
    return rt->CallGlobal("NewLinkProfile", {rt->MakeFolderItem(out), 0, p1, p2, p3, p4});
  }
  ProfileFiles files;
  int sources_ = 0;
};

// One colour through a transform, in doubles.
std::vector<double> Through(const LcmsChain& t, const std::vector<double>& in, std::size_t outChannels) {
  std::vector<double> out(outChannels);
  t.Run(in.data(), out.data());
  return out;
}

TEST_F(NewProfilesTest, ALinkConvertsLikeItsChainWithEachProfilesIntentAndPcsEnds) {
  const struct {
    const char* name;
    const char *first, *second;  // p1 and p3 of the call
    int firstIntent, secondIntent;
    cmsUInt32Number inFormat, outFormat;
    std::size_t outChannels;
    double tolerance;  // per channel, in the format's units (the link's grid resamples)
    std::vector<std::vector<double>> samples;
  } cases[] = {
      {"rgb-cmyk", "sRGB.icc", "ghostscript/default_cmyk.icc", 3, 0, TYPE_RGB_DBL, TYPE_CMYK_DBL, 4, 2.5,
       {{1, 1, 1}, {0.8, 0.2, 0.1}, {0.1, 0.5, 0.9}, {0.5, 0.5, 0.5}}},
      {"rgb-lab", "sRGB.icc", "LCMSLABI.ICM", 0, 0, TYPE_RGB_DBL, TYPE_Lab_DBL, 3, 1.0,
       {{1, 1, 1}, {1, 0, 0}, {0.1, 0.5, 0.9}, {0.5, 0.5, 0.5}}},
      // XYZ spans 0 to 2 in a lut16 grid: coarser steps than device values get.
      {"xyz-rgb", "LCMSXYZI.ICM", "sRGB.icc", 1, 1, TYPE_XYZ_DBL, TYPE_RGB_DBL, 3, 0.03,
       {{0.9642, 1.0, 0.8249}, {0.4, 0.3, 0.2}, {0.3, 0.3, 0.25}}},
  };
  // Names a link is staged under, taken already: they are passed over and kept.
  for (int i = 0; i < 8; ++i) ProfileFiles::Write(files.Path("~tw" + std::to_string(i) + ".tmp"), {'k'});
  Object debugger = Debugger();
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string out = files.Path(std::string(c.name) + ".icc");
    const std::size_t before = rt->LiveObjects();
    {
      Object p1 = Open(c.first, c.firstIntent), p3 = Open(c.second, c.secondIntent);
      // The link from p1 then p3; the nil places close up.
      log.entries.clear();
      const Value link = Link(out, p1, Value(), p3);
      ASSERT_TRUE(link.IsObject());
      EXPECT_EQ(Error(), 0);
      EXPECT_TRUE(rt->Call(link.AsObject(), "ValidProfile").AsBoolean());
      EXPECT_EQ(rt->Get(link.AsObject(), "Type").AsString(), "link");
    }
    EXPECT_EQ(rt->LiveObjects(), before);
    const std::vector<char> bytes = ProfileFiles::Read(out);
    ASSERT_GE(bytes.size(), 132u);
    EXPECT_EQ(BigEndian(bytes, 0), bytes.size());
    // The traces before the file is written: its size, then where it goes.
    const std::vector<std::string> expected = {"DebugString:SIZE:", "DebugInteger:" + std::to_string(bytes.size()),
                                               "DebugString:Path",
                                               "DebugString:" + rt->FolderItemPath(rt->MakeFolderItem(out))};
    const auto at = std::search(log.entries.begin(), log.entries.end(), expected.begin(), expected.end());
    EXPECT_NE(at, log.entries.end());

    const LcmsChain viaLink({out}, c.inFormat, c.outFormat, {INTENT_PERCEPTUAL});
    const cmsUInt32Number first = cmsUInt32Number(c.firstIntent), second = cmsUInt32Number(c.secondIntent);
    const LcmsChain viaChain({c.first, c.second}, c.inFormat, c.outFormat, {first, second});
    const LcmsChain wrongIntents({c.first, c.second}, c.inFormat, c.outFormat, {second, first});
    double wrongBy = 0;
    for (const auto& in : c.samples) {
      const auto a = Through(viaLink, in, c.outChannels), b = Through(viaChain, in, c.outChannels),
                 w = Through(wrongIntents, in, c.outChannels);
      for (std::size_t k = 0; k < c.outChannels; ++k) {
        EXPECT_NEAR(a[k], b[k], c.tolerance) << "sample " << in[0] << " " << in[1] << " " << in[2] << " channel " << k;
        wrongBy = std::max(wrongBy, std::fabs(w[k] - b[k]));
      }
    }
    // Where the two intents differ, the link must have taken each profile's own.
    if (c.firstIntent != c.secondIntent) {
      EXPECT_GT(wrongBy, 2 * c.tolerance);
    }
  }
  for (int i = 0; i < 8; ++i) EXPECT_EQ(ProfileFiles::Read(files.Path("~tw" + std::to_string(i) + ".tmp")).size(), 1u);
}

TEST_F(NewProfilesTest, AFailedLinkReturnsNilLeavesNoObjectAndKeepsTheOldFile) {
  Object log_ = Debugger();
  const std::string out = files.Path("old.icc");
  ProfileFiles::Write(out, {'o', 'l', 'd'});
  const std::size_t before = rt->LiveObjects();
  Object empty = rt->New("Profile", {rt->MakeFolderItem(files.Path("none.icc"))});  // no profile open

  // No usable profile: nothing to link.
  EXPECT_TRUE(Link(out, Value(), empty).IsNil());
  EXPECT_EQ(Error(), 87);
  EXPECT_TRUE(Traced("Error creating device link"));
  Object srgb = Open("sRGB.icc", 0), cmyk = Open("ghostscript/default_cmyk.icc", 0);

  // Destinations the link cannot be put at: the codes and traces of the original, and the
  // file there, if any, untouched.
  const std::string folder = files.Path("folder.icc");
  mkdir(folder.c_str(), 0755);
  const std::string readOnly = files.Path("ro.icc");
  ProfileFiles::Write(readOnly, {'r', 'o'});
  chmod(readOnly.c_str(), 0444);
  const struct {
    std::string path;
    int code;
    const char* trace;
  } cases[] = {
      {folder, -1, "DebugString:Error creating device file"},
      {readOnly, -1, "DebugString:Error creating device file"},
      {files.Path("missing/x.icc"), -1, "DebugString:Error creating device file"},
      {files.Path(std::string(300, 'n')), -1, "DebugString:Error creating device file"},
      {out, -2, "DebugString:Error writting device file"},  // with the file size limited below
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.path);
    const auto listing = ProfileFiles::Listing(files.Path(""));
    log.entries.clear();
    struct rlimit saved;
    getrlimit(RLIMIT_FSIZE, &saved);
    if (c.code == -2) {
      signal(SIGXFSZ, SIG_IGN);
      struct rlimit small = saved;
      small.rlim_cur = 1024;  // the link is larger
      setrlimit(RLIMIT_FSIZE, &small);
    }
    const Value link = Link(c.path, srgb, cmyk);
    setrlimit(RLIMIT_FSIZE, &saved);
    EXPECT_TRUE(link.IsNil());
    EXPECT_EQ(Error(), c.code);
    ASSERT_GE(log.entries.size(), 2u);
    EXPECT_EQ(log.entries[log.entries.size() - 2], c.trace);
    EXPECT_EQ(log.entries.back(), "DebugError:" + std::to_string(c.code) + ",");
    EXPECT_EQ(ProfileFiles::Listing(files.Path("")), listing);  // nothing left beside it
  }
  EXPECT_EQ(ProfileFiles::Read(out), (std::vector<char>{'o', 'l', 'd'}));
  EXPECT_EQ(ProfileFiles::Read(readOnly), (std::vector<char>{'r', 'o'}));
  EXPECT_EQ(rt->LiveObjects(), before + 3);  // the three the test made; no new Profile kept
}

TEST_F(NewProfilesTest, CopyIsOfTheSavedFileAndANilOrFailedCopyTouchesNothing) {
  const std::string src = files.Copy("sRGB.icc", "p.icc");
  const std::vector<char> saved = ProfileFiles::Read(src);
  Object p = rt->New("Profile", {rt->MakeFolderItem(src)});
  rt->Set(p, "Model", 4242);  // not saved
  const std::string out = files.Path("copy.icc");
  ProfileFiles::Write(out, {'o', 'l', 'd'});
  Value copy = rt->CallGlobal("CopyProfile", {rt->MakeFolderItem(out), p});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(ProfileFiles::Read(out), saved);
  EXPECT_EQ(rt->Get(copy.AsObject(), "Model").AsInteger(), 0);
  EXPECT_EQ(rt->Get(p, "Model").AsInteger(), 4242);

  // p nil: a new, empty Profile; f is not touched, not even created.
  const std::string absent = files.Path("absent.icc");
  ProfileFiles::Write(out, {'o', 'l', 'd'});
  copy = Value();
  const auto working = ProfileFiles::Listing(ProfileFiles::PluginWorkingFolder());
  for (const std::string& f : {out, absent}) {
    copy = Value();  // its destructor reports too
    copy = rt->CallGlobal("CopyProfile", {rt->MakeFolderItem(f), Value()});
    ASSERT_TRUE(copy.IsObject());
    EXPECT_EQ(Error(), -404);
    EXPECT_FALSE(rt->Call(copy.AsObject(), "ValidProfile").AsBoolean());
  }
  EXPECT_EQ(ProfileFiles::Read(out), (std::vector<char>{'o', 'l', 'd'}));
  EXPECT_FALSE(ProfileFiles::Exists(absent));
  EXPECT_EQ(ProfileFiles::Listing(ProfileFiles::PluginWorkingFolder()), working);

  // p's own file gone: the copy fails, and the old f is not handed back as the copy.
  unlink(src.c_str());
  copy = Value();
  copy = rt->CallGlobal("CopyProfile", {rt->MakeFolderItem(out), p});
  EXPECT_EQ(Error(), 2);  // ERROR_FILE_NOT_FOUND
  EXPECT_FALSE(rt->Call(copy.AsObject(), "ValidProfile").AsBoolean());
  EXPECT_EQ(ProfileFiles::Read(out), (std::vector<char>{'o', 'l', 'd'}));
}

// The template lies in the shared temporary folder, so its cases run in one test, in
// order: made at start-up when missing, kept when the user's, used by BlankProfile. It
// is a v2 RGB display profile that Little CMS opens and converts with, through its
// tables as well as its colorants and curves.
TEST_F(NewProfilesTest, TheBlankTemplateIsMadeWhenMissingAndTheUsersWins) {
  const std::string templ = ProfileFiles::PluginTempFolder() + "blank.icc";
  const std::string out = files.Path("blank.icc");
  ProfileFiles::Write(out, ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc"));  // replaced by the blank

  // A new start lays the template down when it is missing (another program starting
  // meanwhile may lay down the same one).
  unlink(templ.c_str());
  rt.reset();
  rt = std::make_unique<host::Runtime>(TINTWELL_PLUGIN_PATH, options);
  cmsHPROFILE t = cmsOpenProfileFromFile(templ.c_str(), "r");
  ASSERT_NE(t, nullptr);
  EXPECT_EQ(cmsGetDeviceClass(t), cmsSigDisplayClass);
  EXPECT_EQ(cmsGetColorSpace(t), cmsSigRgbData);
  EXPECT_LT(cmsGetProfileVersion(t), 3.0);
  for (cmsTagSignature sig : {cmsSigProfileDescriptionTag, cmsSigCopyrightTag, cmsSigMediaWhitePointTag,
                              cmsSigRedColorantTag, cmsSigGreenColorantTag, cmsSigBlueColorantTag, cmsSigRedTRCTag,
                              cmsSigGreenTRCTag, cmsSigBlueTRCTag, cmsSigAToB0Tag, cmsSigBToA0Tag})
    EXPECT_TRUE(cmsIsTag(t, sig)) << std::hex << sig;
  cmsHPROFILE lab = cmsCreateLab4Profile(nullptr);
  for (cmsUInt32Number intent : {INTENT_PERCEPTUAL, INTENT_RELATIVE_COLORIMETRIC}) {  // tables, then shaper
    cmsHTRANSFORM toLab = cmsCreateTransform(t, TYPE_RGB_DBL, lab, TYPE_Lab_DBL, intent, cmsFLAGS_NOCACHE);
    cmsHTRANSFORM fromLab = cmsCreateTransform(lab, TYPE_Lab_DBL, t, TYPE_RGB_DBL, intent, cmsFLAGS_NOCACHE);
    ASSERT_TRUE(toLab && fromLab);
    const double white[3] = {1, 1, 1}, red[3] = {1, 0, 0}, mid[3] = {0.2, 0.5, 0.7};
    cmsCIELab w, r;
    cmsDoTransform(toLab, white, &w, 1);
    cmsDoTransform(toLab, red, &r, 1);
    EXPECT_NEAR(w.L, 100, 0.5) << intent;
    EXPECT_NEAR(r.L, 54.3, 1.5) << intent;  // sRGB red in D50
    EXPECT_NEAR(r.a, 80.8, 3) << intent;
    cmsCIELab m;
    double back[3];
    cmsDoTransform(toLab, mid, &m, 1);
    cmsDoTransform(fromLab, &m, back, 1);
    for (int k = 0; k < 3; ++k) EXPECT_NEAR(back[k], mid[k], 0.01) << intent;
    cmsDeleteTransform(toLab);
    cmsDeleteTransform(fromLab);
  }
  cmsCloseProfile(lab);
  cmsCloseProfile(t);

  // BlankProfile over the existing f: the template without its tables, already saved.
  Object debugger = Debugger();
  Object b = rt->CallGlobal("BlankProfile", {rt->MakeFolderItem(out)}).AsObject();
  EXPECT_EQ(Error(), 0);
  ASSERT_GE(log.entries.size(), 4u);
  EXPECT_EQ(std::vector<std::string>(log.entries.begin(), log.entries.begin() + 4),
            (std::vector<std::string>{"DebugString:From:", "DebugString:" + rt->FolderItemPath(rt->MakeFolderItem(templ)),
                                      "DebugString:To:", "DebugString:" + rt->FolderItemPath(rt->MakeFolderItem(out))}));
  EXPECT_EQ(rt->Call(b, "GetDescTypeTag", {"desc"}).AsString(), "Blank RGB profile");
  cmsHPROFILE saved = cmsOpenProfileFromFile(out.c_str(), "r");
  ASSERT_NE(saved, nullptr);
  EXPECT_FALSE(cmsIsTag(saved, cmsSigAToB0Tag));
  EXPECT_FALSE(cmsIsTag(saved, cmsSigBToA0Tag));
  EXPECT_TRUE(cmsIsTag(saved, cmsSigRedTRCTag));
  cmsCloseProfile(saved);
  b = Object();
  rt->CallGlobal("halvoUnregisterDebugger");
  debugger = Object();

  // A template the user put there stays, and is the one used.
  const std::vector<char> made = ProfileFiles::Read(templ);
  ProfileFiles::Write(templ, ProfileFiles::Read(TINTWELL_ICC_DIR "/compatibleWithAdobeRGB1998.icc"));
  rt.reset();
  rt = std::make_unique<host::Runtime>(TINTWELL_PLUGIN_PATH, options);
  EXPECT_EQ(ProfileFiles::Read(templ), ProfileFiles::Read(TINTWELL_ICC_DIR "/compatibleWithAdobeRGB1998.icc"));
  b = rt->CallGlobal("BlankProfile", {rt->MakeFolderItem(out)}).AsObject();
  EXPECT_NE(rt->Call(b, "GetDescTypeTag", {"desc"}).AsString(), "Blank RGB profile");
  b = Object();
  ProfileFiles::Write(templ, made);
}

}  // namespace
