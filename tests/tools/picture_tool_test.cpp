// The picture command on real PNG and JPEG files: colours against Little CMS, the
// destination profile embedded, alpha and 16-bit depth kept, the input's own profile
// taken, and refusals that leave files alone.
#include <gtest/gtest.h>
#include <dirent.h>
#include <lcms2.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#include "image_files.h"

namespace {

using testimage::Bytes;
using testimage::Image;

const std::string kWide = std::string(TINTWELL_ICC_DIR) + "/colord/ProPhotoRGB.icc";
const std::string kSrgb = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc";

std::string Temp(const std::string& name) { return ::testing::TempDir() + "twp_" + std::to_string(getpid()) + "_" + name; }

struct Result {
  int status;
  std::string err;
};

Result RunPicture(const std::string& args) {
  const std::string err = Temp("err");
  const int raw = std::system((std::string("'") + TINTWELL_TOOL + "' " + args + " >/dev/null 2>" + err).c_str());
  const Bytes text = testimage::ReadFile(err);
  return {WIFEXITED(raw) ? WEXITSTATUS(raw) : -1, std::string(text.begin(), text.end())};
}

// Little CMS from one profile file to another, 8-bit RGB, each profile's header intent.
Bytes Lcms(const std::string& from, const std::string& to, const Bytes& rgb) {
  cmsHPROFILE p[2] = {cmsOpenProfileFromFile(from.c_str(), "r"), cmsOpenProfileFromFile(to.c_str(), "r")};
  cmsUInt32Number intents[2] = {cmsGetHeaderRenderingIntent(p[0]), cmsGetHeaderRenderingIntent(p[1])};
  cmsBool bpc[2] = {FALSE, FALSE};
  cmsFloat64Number adaptation[2] = {1, 1};
  cmsHTRANSFORM x =
      cmsCreateExtendedTransform(nullptr, 2, p, bpc, intents, adaptation, nullptr, 0, TYPE_RGB_8, TYPE_RGB_8, 0);
  Bytes out(rgb.size());
  cmsDoTransform(x, rgb.data(), out.data(), static_cast<cmsUInt32Number>(rgb.size() / 3));
  cmsDeleteTransform(x), cmsCloseProfile(p[0]), cmsCloseProfile(p[1]);
  return out;
}

Image Noise(int width, int height, int depth, int channels, unsigned seed) {
  Image im;
  im.width = width, im.height = height, im.depth = depth, im.channels = channels;
  std::mt19937 rng(seed);
  const std::uint32_t top = depth == 16 ? 65535 : 255;
  for (int i = 0; i < width * height * channels; ++i) im.samples.push_back(rng() % (top + 1));
  if (channels >= 3) {  // pure red and pure blue first: a swap of the two shows at once
    for (int c = 0; c < 3; ++c) im.samples[c] = c == 0 ? top : 0, im.samples[channels + c] = c == 2 ? top : 0;
  }
  return im;
}

// The 8-bit RGB the tool hands the plugin for each pixel.
Bytes Rgb8(const Image& im) {
  Bytes rgb;
  for (int y = 0; y < im.height; ++y)
    for (int x = 0; x < im.width; ++x)
      for (int c = 0; c < 3; ++c) {
        const std::uint32_t v = im.at(x, y, im.channels >= 3 ? c : 0);
        rgb.push_back(static_cast<std::uint8_t>(im.depth == 16 ? (v + 128) / 257 : v));
      }
  return rgb;
}

// The output's colour channels against expected 8-bit values (within 1 step), its alpha
// against the input's exactly.
void ExpectPixels(const Image& out, const Image& in, const Bytes& want) {
  ASSERT_EQ(out.width, in.width);
  ASSERT_EQ(out.height, in.height);
  const bool alpha = in.channels == 2 || in.channels == 4;
  ASSERT_EQ(out.channels, alpha ? 4 : 3);
  int bad = 0;
  for (int y = 0; y < out.height; ++y)
    for (int x = 0; x < out.width; ++x) {
      for (int c = 0; c < 3; ++c) {
        const std::uint32_t v = out.at(x, y, c);
        if (out.depth == 16 && v % 257 != 0) ++bad;  // widened from 8 bits
        const int got = static_cast<int>(out.depth == 16 ? v / 257 : v);
        if (std::abs(got - want[(static_cast<std::size_t>(y) * out.width + x) * 3 + c]) > 1) ++bad;
      }
      if (alpha && out.at(x, y, 3) != in.at(x, y, in.channels - 1)) ++bad;
    }
  EXPECT_EQ(bad, 0);
}

TEST(PictureTool, PngsOfEachKindKeepAlphaAndDepth) {
  const std::string in = Temp("in.png"), out = Temp("out.png");
  const struct {
    int depth, channels;
  } kinds[] = {{8, 3}, {8, 4}, {16, 3}, {16, 4}, {8, 1}, {16, 2}};
  for (const auto& k : kinds) {
    SCOPED_TRACE(std::to_string(k.depth) + " bits, " + std::to_string(k.channels) + " channels");
    const Image image = Noise(7, 5, k.depth, k.channels, static_cast<unsigned>(k.depth * 10 + k.channels));
    testimage::WritePng(in, image);
    const Result r = RunPicture("picture srgb '" + kWide + "' '" + in + "' '" + out + "'");
    ASSERT_EQ(r.status, 0) << r.err;
    const Image result = testimage::ReadPng(out);
    EXPECT_EQ(result.depth, k.depth);
    EXPECT_EQ(result.icc, testimage::ReadFile(kWide));
    ExpectPixels(result, image, Lcms(kSrgb, kWide, Rgb8(image)));
  }
}

TEST(PictureTool, EmbeddedTakesTheInputsProfileElseSrgb) {
  const std::string png = Temp("wide.png"), jpeg = Temp("wide.jpg"), out = Temp("out.png");
  Image image = Noise(6, 4, 8, 3, 5);
  // A profile that is not RGB is passed over with a warning (libpng refuses to write one
  // into an RGB PNG; a JPEG takes it).
  const struct {
    std::string icc, source;
    bool png;
  } cases[] = {{kWide, kWide, true}, {"", kSrgb, true}, {std::string(TINTWELL_ICC_DIR) + "/Gray.icc", kSrgb, false}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.icc);
    image.icc = c.icc.empty() ? Bytes() : testimage::ReadFile(c.icc);
    if (c.png) {
      testimage::WritePng(png, image);
      const Result r = RunPicture("picture embedded srgb '" + png + "' '" + out + "'");
      ASSERT_EQ(r.status, 0) << r.err;
      ExpectPixels(testimage::ReadPng(out), image, Lcms(c.source, kSrgb, Rgb8(image)));
    }
    // JPEG in: compared against the pixels the file decodes to.
    testimage::WriteJpeg(jpeg, image);
    const Result r = RunPicture("picture embedded srgb '" + jpeg + "' '" + out + "'");
    ASSERT_EQ(r.status, 0) << r.err;
    EXPECT_EQ(r.err.find("not an RGB profile") != std::string::npos, !c.png) << r.err;
    const Image decoded = testimage::ReadJpeg(jpeg);
    ExpectPixels(testimage::ReadPng(out), decoded, Lcms(c.source, kSrgb, Rgb8(decoded)));
  }
}

TEST(PictureTool, JpegOutCarriesTheProfileAndDropsAlpha) {
  const std::string in = Temp("alpha.png"), out = Temp("out.JPEG");
  testimage::WritePng(in, Noise(9, 3, 8, 4, 9));
  const Result r = RunPicture("picture srgb '" + kWide + "' '" + in + "' '" + out + "'");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(r.err.find("no alpha"), std::string::npos);
  const Image result = testimage::ReadJpeg(out);
  EXPECT_EQ(result.width, 9);
  EXPECT_EQ(result.height, 3);
  EXPECT_EQ(result.icc, testimage::ReadFile(kWide));
  // Through a profile between, with another intent: still RGB to RGB.
  const Result via = RunPicture("--via lab --intent 1 picture srgb srgb '" + in + "' '" + out + "'");
  EXPECT_EQ(via.status, 0) << via.err;
}

// A file of the kind whose header claims width x height pixels it does not hold: big-endian
// 16-bit fields in a JPEG's frame header, 32-bit ones in a PNG's (its checksum made to match).
std::string Claiming(bool png, std::uint32_t width, std::uint32_t height) {
  const std::string path = Temp(png ? "huge.png" : "huge.jpg");
  png ? testimage::WritePng(path, Noise(2, 2, 8, 3, 3)) : testimage::WriteJpeg(path, Noise(8, 8, 8, 3, 2));
  Bytes bytes = testimage::ReadFile(path);
  std::size_t at = 16;
  if (!png)
    for (at = 0; !(bytes[at] == 0xFF && bytes[at + 1] == 0xC0);) ++at;
  const int size = png ? 4 : 2;
  for (int i = 0; i < size; ++i) {
    bytes[at + (png ? i : 7 + i)] = static_cast<std::uint8_t>(width >> (8 * (size - 1 - i)));
    bytes[at + (png ? 4 + i : 5 + i)] = static_cast<std::uint8_t>(height >> (8 * (size - 1 - i)));
  }
  if (png) {
    std::uint32_t crc = 0xFFFFFFFF;  // over the chunk's type and data
    for (int i = 12; i < 29; ++i) {
      crc ^= bytes[i];
      for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1)));
    }
    for (int i = 0; i < 4; ++i) bytes[29 + i] = static_cast<std::uint8_t>(~crc >> (24 - 8 * i));
  }
  testimage::WriteFile(path, bytes);
  return path;
}

TEST(PictureTool, RefusalsLeaveTheOutputAlone) {
  const std::string in = Temp("ok.png"), out = Temp("keep.png"), junk = Temp("junk.png"), cmyk = Temp("cmyk.jpg");
  testimage::WritePng(in, Noise(2, 2, 8, 3, 1));
  const std::string pngMagic = "\x89PNG\r\n\x1a\n but not really";
  testimage::WriteFile(junk, Bytes(pngMagic.begin(), pngMagic.end()));
  testimage::WriteJpeg(cmyk, Image{2, 1, 8, 4, std::vector<std::uint32_t>(8), {}});
  const struct {
    std::string args;
    int status;
    const char* says;
  } cases[] = {
      {"picture srgb srgb '" + in + "' '" + Temp("out.gif") + "'", 2, ".png, .jpg or .jpeg"},
      {"picture srgb srgb '" + in + "'", 2, "SRC DST IN OUT"},
      {"picture srgb srgb '" + Temp("missing.png") + "' '" + out + "'", 1, "cannot open"},
      {"picture srgb srgb '" + junk + "' '" + out + "'", 1, "not a readable PNG"},
      {"picture srgb srgb '" + kSrgb + "' '" + out + "'", 1, "neither a PNG nor a JPEG"},
      {"picture srgb cmyk '" + in + "' '" + out + "'", 1, "not an RGB profile"},
      {"picture lab srgb '" + in + "' '" + out + "'", 1, "not an RGB profile"},
      {"picture srgb srgb '" + Claiming(false, 20000, 20000) + "' '" + out + "'", 1, "image too large for a picture"},
      {"picture srgb srgb '" + Claiming(true, 100000, 100000) + "' '" + out + "'", 1, "image too large for a picture"},
      {"picture srgb srgb '" + cmyk + "' '" + out + "'", 1, "CMYK JPEG files are not supported (pictures are RGB)"},
      {"picture srgb srgb '" + in + "' '" + Temp("no/such/folder.png") + "'", 1, "cannot write "},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.args);
    testimage::WriteFile(out, {'o', 'l', 'd'});
    const Result r = RunPicture(c.args);
    EXPECT_EQ(r.status, c.status);
    EXPECT_NE(r.err.find(c.says), std::string::npos) << r.err;
    EXPECT_EQ(r.err.find("CMError"), std::string::npos) << r.err;  // not the plugin's failure
    EXPECT_EQ(testimage::ReadFile(out), (Bytes{'o', 'l', 'd'}));
  }
  // A folder where the output would go: the finished file cannot take its place, and its
  // staged copy beside it goes too.
  const std::string folder = Temp("folder.png"), staged = folder.substr(folder.rfind('/') + 1) + ".tmp-";
  ASSERT_EQ(mkdir(folder.c_str(), 0755), 0);
  const Result r = RunPicture("picture srgb srgb '" + in + "' '" + folder + "'");
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("cannot write " + folder), std::string::npos) << r.err;
  DIR* dir = opendir(::testing::TempDir().c_str());
  while (const dirent* e = dir ? readdir(dir) : nullptr) EXPECT_NE(std::string(e->d_name).rfind(staged, 0), 0u);
  if (dir) closedir(dir);
  rmdir(folder.c_str());
}

}  // namespace
