// Writes the tool's built-in profiles with Little CMS: sRGB, a Lab D50 identity
// profile and a gamma-2.2 gray, into the folder given.
#include <lcms2.h>

#include <cstdio>
#include <string>

namespace {

bool Save(cmsHPROFILE profile, const std::string& path, const char* description) {
  if (!profile) return false;
  cmsMLU* text = cmsMLUalloc(nullptr, 1);
  cmsMLUsetASCII(text, "en", "US", description);
  cmsWriteTag(profile, cmsSigProfileDescriptionTag, text);
  cmsMLUfree(text);
  const bool ok = cmsSaveProfileToFile(profile, path.c_str()) != 0;
  cmsCloseProfile(profile);
  if (!ok) std::fprintf(stderr, "make_default_profiles: cannot write %s\n", path.c_str());
  return ok;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: make_default_profiles FOLDER\n");
    return 2;
  }
  const std::string folder = argv[1];
  cmsToneCurve* gamma = cmsBuildGamma(nullptr, 2.2);
  cmsHPROFILE gray = cmsCreateGrayProfile(cmsD50_xyY(), gamma);
  cmsFreeToneCurve(gamma);
  cmsHPROFILE srgb = cmsCreate_sRGBProfile();
  cmsSetProfileVersion(srgb, 2.1);
  cmsHPROFILE lab = cmsCreateLab2Profile(cmsD50_xyY());
  const bool ok = Save(srgb, folder + "/sRGB.icc", "sRGB built-in") &&
                  Save(lab, folder + "/LabD50.icc", "Lab D50 identity") &&
                  Save(gray, folder + "/Gray22.icc", "Gray gamma 2.2 D50");
  return ok ? 0 : 1;
}
