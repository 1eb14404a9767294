// The picture command on real PNG and JPEG files made here with libpng and libjpeg:
// colours against Little CMS, the destination profile embedded, alpha and 16-bit depth
// kept, the input's own profile taken, and refusals that leave files alone.
#include <gtest/gtest.h>

#include <cstdio>  // before jpeglib.h, which uses FILE and size_t without including them
#include <jpeglib.h>
#include <lcms2.h>
#include <png.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

namespace {

const std::string kWide = std::string(TINTWELL_ICC_DIR) + "/colord/ProPhotoRGB.icc";
const std::string kSrgb = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc";

struct Result {
  int status;
  std::string err;
};

std::vector<std::uint8_t> Slurp(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::vector<std::uint8_t>(std::istreambuf_iterator<char>(in), {});
}

std::string Temp(const std::string& name) { return ::testing::TempDir() + "twp_" + std::to_string(getpid()) + "_" + name; }

Result RunPicture(const std::string& args) {
  const std::string err = Temp("err");
  const int raw = std::system((std::string("'") + TINTWELL_TOOL + "' " + args + " >/dev/null 2>" + err).c_str());
  const std::vector<std::uint8_t> text = Slurp(err);
  return {WIFEXITED(raw) ? WEXITSTATUS(raw) : -1, std::string(text.begin(), text.end())};
}

// An image as samples: channels per pixel (1 gray, 2 gray+alpha, 3 RGB, 4 RGBA), each
// sample 0-255 or 0-65535 by depth.
struct Image {
  int width = 0, height = 0, depth = 8, channels = 3;
  std::vector<std::uint32_t> samples;
  std::vector<std::uint8_t> icc;
  std::uint32_t at(int x, int y, int c) const { return samples[(static_cast<std::size_t>(y) * width + x) * channels + c]; }
};

void WritePng(const std::string& path, const Image& im) {
  std::FILE* f = std::fopen(path.c_str(), "wb");
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  png_init_io(png, f);
  const int types[] = {0, PNG_COLOR_TYPE_GRAY, PNG_COLOR_TYPE_GRAY_ALPHA, PNG_COLOR_TYPE_RGB, PNG_COLOR_TYPE_RGBA};
  png_set_IHDR(png, info, im.width, im.height, im.depth, types[im.channels], PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (!im.icc.empty()) png_set_iCCP(png, info, "icc", 0, im.icc.data(), static_cast<png_uint_32>(im.icc.size()));
  png_write_info(png, info);
  const int bytes = im.depth / 8;
  std::vector<png_byte> row(static_cast<std::size_t>(im.width) * im.channels * bytes);
  for (int y = 0; y < im.height; ++y) {
    for (int i = 0; i < im.width * im.channels; ++i) {
      const std::uint32_t v = im.samples[static_cast<std::size_t>(y) * im.width * im.channels + i];
      if (bytes == 2) row[2 * i] = static_cast<png_byte>(v >> 8), row[2 * i + 1] = static_cast<png_byte>(v);
      else row[i] = static_cast<png_byte>(v);
    }
    png_write_row(png, row.data());
  }
  png_write_end(png, nullptr);
  png_destroy_write_struct(&png, &info);
  std::fclose(f);
}

Image ReadPng(const std::string& path) {
  Image im;
  std::FILE* f = std::fopen(path.c_str(), "rb");
  if (!f) return im;
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  png_init_io(png, f);
  png_read_info(png, info);
  im.width = static_cast<int>(png_get_image_width(png, info));
  im.height = static_cast<int>(png_get_image_height(png, info));
  im.depth = png_get_bit_depth(png, info);
  im.channels = png_get_channels(png, info);
  png_charp name;
  int compression;
  png_bytep profile = nullptr;
  png_uint_32 length = 0;
  if (png_get_iCCP(png, info, &name, &compression, &profile, &length)) im.icc.assign(profile, profile + length);
  std::vector<png_byte> row(png_get_rowbytes(png, info));
  for (int y = 0; y < im.height; ++y) {
    png_read_row(png, row.data(), nullptr);
    for (int i = 0; i < im.width * im.channels; ++i)
      im.samples.push_back(im.depth == 16 ? static_cast<std::uint32_t>(row[2 * i] << 8 | row[2 * i + 1]) : row[i]);
  }
  png_destroy_read_struct(&png, &info, nullptr);
  std::fclose(f);
  return im;
}

void WriteJpeg(const std::string& path, const Image& im) {
  jpeg_compress_struct c;
  jpeg_error_mgr e;
  c.err = jpeg_std_error(&e);
  jpeg_create_compress(&c);
  std::FILE* f = std::fopen(path.c_str(), "wb");
  jpeg_stdio_dest(&c, f);
  c.image_width = im.width;
  c.image_height = im.height;
  c.input_components = 3;
  c.in_color_space = JCS_RGB;
  jpeg_set_defaults(&c);
  jpeg_start_compress(&c, TRUE);
  if (!im.icc.empty()) jpeg_write_icc_profile(&c, im.icc.data(), static_cast<unsigned>(im.icc.size()));
  std::vector<JSAMPLE> row(static_cast<std::size_t>(im.width) * 3);
  while (c.next_scanline < c.image_height) {
    for (int i = 0; i < im.width * 3; ++i) row[i] = static_cast<JSAMPLE>(im.samples[c.next_scanline * im.width * 3 + i]);
    JSAMPROW rows[1] = {row.data()};
    jpeg_write_scanlines(&c, rows, 1);
  }
  jpeg_finish_compress(&c);
  jpeg_destroy_compress(&c);
  std::fclose(f);
}

Image ReadJpeg(const std::string& path) {
  Image im;
  jpeg_decompress_struct d;
  jpeg_error_mgr e;
  d.err = jpeg_std_error(&e);
  jpeg_create_decompress(&d);
  std::FILE* f = std::fopen(path.c_str(), "rb");
  jpeg_stdio_src(&d, f);
  jpeg_save_markers(&d, JPEG_APP0 + 2, 0xFFFF);
  jpeg_read_header(&d, TRUE);
  JOCTET* profile = nullptr;
  unsigned length = 0;
  if (jpeg_read_icc_profile(&d, &profile, &length)) im.icc.assign(profile, profile + length), std::free(profile);
  d.out_color_space = JCS_RGB;
  jpeg_start_decompress(&d);
  im.width = static_cast<int>(d.output_width);
  im.height = static_cast<int>(d.output_height);
  std::vector<JSAMPLE> row(static_cast<std::size_t>(im.width) * 3);
  while (d.output_scanline < d.output_height) {
    JSAMPROW rows[1] = {row.data()};
    jpeg_read_scanlines(&d, rows, 1);
    im.samples.insert(im.samples.end(), row.begin(), row.end());
  }
  jpeg_finish_decompress(&d);
  jpeg_destroy_decompress(&d);
  std::fclose(f);
  return im;
}

// Little CMS from one profile file to another, 8-bit RGB, each profile's header intent.
std::vector<std::uint8_t> Lcms(const std::string& from, const std::string& to, const std::vector<std::uint8_t>& rgb) {
  cmsHPROFILE p[2] = {cmsOpenProfileFromFile(from.c_str(), "r"), cmsOpenProfileFromFile(to.c_str(), "r")};
  cmsUInt32Number intents[2] = {cmsGetHeaderRenderingIntent(p[0]), cmsGetHeaderRenderingIntent(p[1])};
  cmsBool bpc[2] = {FALSE, FALSE};
  cmsFloat64Number adaptation[2] = {1, 1};
  cmsHTRANSFORM x =
      cmsCreateExtendedTransform(nullptr, 2, p, bpc, intents, adaptation, nullptr, 0, TYPE_RGB_8, TYPE_RGB_8, 0);
  std::vector<std::uint8_t> out(rgb.size());
  cmsDoTransform(x, rgb.data(), out.data(), static_cast<cmsUInt32Number>(rgb.size() / 3));
  cmsDeleteTransform(x);
  cmsCloseProfile(p[0]);
  cmsCloseProfile(p[1]);
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

// The 8-bit RGB the tool hands the plugin for each pixel of a PNG.
std::vector<std::uint8_t> Rgb8(const Image& im) {
  std::vector<std::uint8_t> rgb;
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
void ExpectPixels(const Image& out, const Image& in, const std::vector<std::uint8_t>& want) {
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
    WritePng(in, image);
    const Result r = RunPicture("picture srgb '" + kWide + "' '" + in + "' '" + out + "'");
    ASSERT_EQ(r.status, 0) << r.err;
    const Image result = ReadPng(out);
    EXPECT_EQ(result.depth, k.depth);
    EXPECT_EQ(result.icc, Slurp(kWide));
    ExpectPixels(result, image, Lcms(kSrgb, kWide, Rgb8(image)));
  }
}

TEST(PictureTool, EmbeddedTakesTheInputsProfileElseSrgb) {
  const std::string png = Temp("wide.png"), jpeg = Temp("wide.jpg"), out = Temp("out.png");
  Image image = Noise(6, 4, 8, 3, 5);
  for (const bool withProfile : {true, false}) {
    SCOPED_TRACE(withProfile);
    image.icc = withProfile ? Slurp(kWide) : std::vector<std::uint8_t>();
    const std::string source = withProfile ? kWide : kSrgb;
    WritePng(png, image);
    Result r = RunPicture("picture embedded srgb '" + png + "' '" + out + "'");
    ASSERT_EQ(r.status, 0) << r.err;
    ExpectPixels(ReadPng(out), image, Lcms(source, kSrgb, Rgb8(image)));
    // JPEG in: compared against the pixels the file decodes to.
    WriteJpeg(jpeg, image);
    r = RunPicture("picture embedded srgb '" + jpeg + "' '" + out + "'");
    ASSERT_EQ(r.status, 0) << r.err;
    const Image decoded = ReadJpeg(jpeg);
    ExpectPixels(ReadPng(out), decoded, Lcms(source, kSrgb, Rgb8(decoded)));
  }
  // A profile that is not RGB is passed over with a warning (libpng refuses to write
  // one into an RGB PNG; a JPEG takes it).
  image.icc = Slurp(std::string(TINTWELL_ICC_DIR) + "/Gray.icc");
  WriteJpeg(jpeg, image);
  const Result r = RunPicture("picture embedded srgb '" + jpeg + "' '" + out + "'");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(r.err.find("not an RGB profile"), std::string::npos) << r.err;
  const Image decoded = ReadJpeg(jpeg);
  ExpectPixels(ReadPng(out), decoded, Lcms(kSrgb, kSrgb, Rgb8(decoded)));
}

TEST(PictureTool, JpegOutCarriesTheProfileAndDropsAlpha) {
  const std::string in = Temp("alpha.png"), out = Temp("out.JPEG");
  WritePng(in, Noise(9, 3, 8, 4, 9));
  const Result r = RunPicture("picture srgb '" + kWide + "' '" + in + "' '" + out + "'");
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_NE(r.err.find("no alpha"), std::string::npos);
  const Image result = ReadJpeg(out);
  EXPECT_EQ(result.width, 9);
  EXPECT_EQ(result.height, 3);
  EXPECT_EQ(result.icc, Slurp(kWide));
  // Through a profile between, with another intent: still RGB to RGB.
  const Result via = RunPicture("--via lab --intent 1 picture srgb srgb '" + in + "' '" + out + "'");
  EXPECT_EQ(via.status, 0) << via.err;
}

// A JPEG whose frame header claims width x height pixels it does not hold.
void WriteJpegClaiming(const std::string& path, int width, int height) {
  WriteJpeg(path, Noise(8, 8, 8, 3, 2));
  std::vector<std::uint8_t> bytes = Slurp(path);
  for (std::size_t i = 0; i + 8 < bytes.size(); ++i)
    if (bytes[i] == 0xFF && bytes[i + 1] == 0xC0) {
      bytes[i + 5] = static_cast<std::uint8_t>(height >> 8), bytes[i + 6] = static_cast<std::uint8_t>(height);
      bytes[i + 7] = static_cast<std::uint8_t>(width >> 8), bytes[i + 8] = static_cast<std::uint8_t>(width);
      break;
    }
  std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()), bytes.size());
}

// A small PNG whose header claims width x height pixels (its checksum made to match).
void WritePngClaiming(const std::string& path, std::uint32_t width, std::uint32_t height) {
  WritePng(path, Noise(2, 2, 8, 3, 3));
  std::vector<std::uint8_t> bytes = Slurp(path);
  for (int i = 0; i < 4; ++i) {
    bytes[16 + i] = static_cast<std::uint8_t>(width >> (24 - 8 * i));
    bytes[20 + i] = static_cast<std::uint8_t>(height >> (24 - 8 * i));
  }
  std::uint32_t crc = 0xFFFFFFFF;  // over the chunk's type and data
  for (int i = 12; i < 29; ++i) {
    crc ^= bytes[i];
    for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1)));
  }
  crc ^= 0xFFFFFFFF;
  for (int i = 0; i < 4; ++i) bytes[29 + i] = static_cast<std::uint8_t>(crc >> (24 - 8 * i));
  std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()), bytes.size());
}

void WriteCmykJpeg(const std::string& path) {
  jpeg_compress_struct c;
  jpeg_error_mgr e;
  c.err = jpeg_std_error(&e);
  jpeg_create_compress(&c);
  std::FILE* f = std::fopen(path.c_str(), "wb");
  jpeg_stdio_dest(&c, f);
  c.image_width = 2, c.image_height = 1, c.input_components = 4, c.in_color_space = JCS_CMYK;
  jpeg_set_defaults(&c);
  jpeg_start_compress(&c, TRUE);
  JSAMPLE row[8] = {};
  JSAMPROW rows[1] = {row};
  jpeg_write_scanlines(&c, rows, 1);
  jpeg_finish_compress(&c);
  jpeg_destroy_compress(&c);
  std::fclose(f);
}

TEST(PictureTool, RefusalsLeaveTheOutputAlone) {
  const std::string in = Temp("ok.png"), out = Temp("keep.png"), junk = Temp("junk.png");
  const std::string huge = Temp("huge.jpg"), hugePng = Temp("huge.png"), cmyk = Temp("cmyk.jpg");
  WritePng(in, Noise(2, 2, 8, 3, 1));
  std::ofstream(out) << "old";
  std::ofstream(junk) << "\x89PNG\r\n\x1a\n but not really";
  WriteJpegClaiming(huge, 20000, 20000);
  WritePngClaiming(hugePng, 100000, 100000);
  WriteCmykJpeg(cmyk);
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
      {"picture srgb srgb '" + huge + "' '" + out + "'", 1, "image too large for a picture"},
      {"picture srgb srgb '" + hugePng + "' '" + out + "'", 1, "image too large for a picture"},
      {"picture srgb srgb '" + cmyk + "' '" + out + "'", 1, "CMYK JPEG files are not supported (pictures are RGB)"},
      {"picture srgb srgb '" + in + "' '" + Temp("no/such/folder.png") + "'", 1, "cannot write "},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.args);
    const Result r = RunPicture(c.args);
    EXPECT_EQ(r.status, c.status);
    EXPECT_NE(r.err.find(c.says), std::string::npos) << r.err;
    EXPECT_EQ(r.err.find("CMError"), std::string::npos) << r.err;  // not the plugin's failure
    const std::vector<std::uint8_t> kept = Slurp(out);
    EXPECT_EQ(std::string(kept.begin(), kept.end()), "old");
  }
}

}  // namespace
