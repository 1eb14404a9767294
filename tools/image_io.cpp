#include "image_io.h"

#include <unistd.h>

#include <cerrno>
#include <csetjmp>
#include <cstdio>  // before jpeglib.h, which uses FILE and size_t without including them
#include <cstdlib>
#include <cstring>
#include <memory>

#include <jpeglib.h>
#include <png.h>

#include "session.h"

namespace tool {

namespace {

struct FileCloser {
  void operator()(std::FILE* f) const {
    if (f) std::fclose(f);
  }
};
using File = std::unique_ptr<std::FILE, FileCloser>;

std::string Lower(std::string s) {
  for (char& c : s) c = static_cast<char>(c >= 'A' && c <= 'Z' ? c - 'A' + 'a' : c);
  return s;
}

// The most pixels a host picture holds.
constexpr std::uint64_t kMaxPixels = std::uint64_t{1} << 28;

// 16-bit to 8-bit, rounding to nearest: 65535 / 257 = 255 exactly.
inline std::uint32_t To8(std::uint32_t v16) { return (v16 + 128) / 257; }

// ---- PNG ----

struct PngReadState {
  char message[200] = "";
};

void PngError(png_structp png, png_const_charp text) {
  auto* state = static_cast<PngReadState*>(png_get_error_ptr(png));
  std::snprintf(state->message, sizeof state->message, "%s", text);
  png_longjmp(png, 1);
}
void PngWarning(png_structp, png_const_charp) {}

// Decodes into rows (RGB or RGBA, 8 or 16 bits, big-endian 16-bit samples). Plain data
// only on this frame beyond the setjmp: libpng leaves by longjmp on an error.
bool DecodePng(std::FILE* f, std::vector<png_byte>* pixels, ImageExtras* x, PngReadState* state) {
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, state, PngError, PngWarning);
  if (!png) return false;
  png_infop info = png_create_info_struct(png);
  std::vector<png_bytep> rows;
  if (!info || setjmp(png_jmpbuf(png))) {
    png_destroy_read_struct(&png, &info, nullptr);
    return false;
  }
  png_init_io(png, f);
  // Pictures as large as memory allows; the picture itself refuses what it cannot hold.
  png_set_user_limits(png, 0x7FFFFFFF, 0x7FFFFFFF);
  png_read_info(png, info);
  png_uint_32 width = 0, height = 0;
  int bitDepth = 0, colorType = 0;
  png_get_IHDR(png, info, &width, &height, &bitDepth, &colorType, nullptr, nullptr, nullptr);
  x->gray = (colorType & PNG_COLOR_MASK_COLOR) == 0;
  x->alpha = (colorType & PNG_COLOR_MASK_ALPHA) != 0 || png_get_valid(png, info, PNG_INFO_tRNS);
  x->depth = bitDepth == 16 ? 16 : 8;
  png_charp name = nullptr;
  int compression = 0;
  png_bytep profile = nullptr;
  png_uint_32 profileLength = 0;
  if (png_get_iCCP(png, info, &name, &compression, &profile, &profileLength) && profile)
    x->icc.assign(profile, profile + profileLength);
  png_set_expand(png);  // palette to RGB, low-bit gray to 8 bits, tRNS to alpha
  png_set_gray_to_rgb(png);
  png_set_interlace_handling(png);
  png_read_update_info(png, info);
  // Checked before a byte is allocated: a header alone can claim four billion pixels.
  if (static_cast<std::uint64_t>(width) * height > kMaxPixels) png_error(png, "image too large for a picture");
  const std::size_t rowBytes = png_get_rowbytes(png, info);
  pixels->resize(rowBytes * height);
  rows.resize(height);
  for (png_uint_32 y = 0; y < height; ++y) rows[y] = pixels->data() + rowBytes * y;
  png_read_image(png, rows.data());
  png_read_end(png, nullptr);
  x->width = static_cast<int>(width);
  x->height = static_cast<int>(height);
  png_destroy_read_struct(&png, &info, nullptr);
  return true;
}

void FillFromPng(host::Runtime& rt, host::Object& picture, const std::vector<png_byte>& pixels, ImageExtras* x) {
  const int channels = x->alpha ? 4 : 3;
  const std::size_t bytes = x->depth == 16 ? 2 : 1;
  const std::size_t count = static_cast<std::size_t>(x->width) * static_cast<std::size_t>(x->height);
  std::uint32_t* out = rt.PicturePixels(picture);
  if (x->alpha) x->alphaPlane.resize(count);
  const png_byte* p = pixels.data();
  for (std::size_t i = 0; i < count; ++i, p += channels * bytes) {
    std::uint32_t v[4];
    for (int c = 0; c < channels; ++c)
      v[c] = bytes == 2 ? static_cast<std::uint32_t>(p[2 * c] << 8 | p[2 * c + 1]) : p[c];
    if (bytes == 2)
      for (int c = 0; c < 3; ++c) v[c] = To8(v[c]);
    out[i] = v[0] << 16 | v[1] << 8 | v[2];
    if (x->alpha) x->alphaPlane[i] = static_cast<std::uint16_t>(v[3]);
  }
}

bool EncodePng(std::FILE* f, const std::uint32_t* pixels, const ImageExtras& x, const std::vector<std::uint8_t>& icc,
               PngReadState* state) {
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, state, PngError, PngWarning);
  if (!png) return false;
  png_infop info = png_create_info_struct(png);
  const int channels = x.alpha ? 4 : 3;
  const std::size_t bytes = x.depth == 16 ? 2 : 1;
  std::vector<png_byte> row(static_cast<std::size_t>(x.width) * channels * bytes);
  if (!info || setjmp(png_jmpbuf(png))) {
    png_destroy_write_struct(&png, &info);
    return false;
  }
  png_init_io(png, f);
  png_set_IHDR(png, info, static_cast<png_uint_32>(x.width), static_cast<png_uint_32>(x.height), x.depth,
               x.alpha ? PNG_COLOR_TYPE_RGB_ALPHA : PNG_COLOR_TYPE_RGB, PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (!icc.empty())
    png_set_iCCP(png, info, "ICC profile", PNG_COMPRESSION_TYPE_BASE, icc.data(), static_cast<png_uint_32>(icc.size()));
  png_write_info(png, info);
  for (int y = 0; y < x.height; ++y) {
    const std::size_t base = static_cast<std::size_t>(y) * static_cast<std::size_t>(x.width);
    png_byte* p = row.data();
    for (int i = 0; i < x.width; ++i) {
      const std::uint32_t rgb = pixels[base + static_cast<std::size_t>(i)];
      std::uint32_t v[4] = {rgb >> 16 & 0xFF, rgb >> 8 & 0xFF, rgb & 0xFF, 0};
      if (x.alpha) v[3] = x.alphaPlane[base + static_cast<std::size_t>(i)];
      for (int c = 0; c < channels; ++c) {
        // Colour channels widen by 257 (255 becomes 65535); alpha is as read.
        const std::uint32_t value = bytes == 2 && c < 3 ? v[c] * 257 : v[c];
        if (bytes == 2) {
          *p++ = static_cast<png_byte>(value >> 8);
          *p++ = static_cast<png_byte>(value);
        } else {
          *p++ = static_cast<png_byte>(value);
        }
      }
    }
    png_write_row(png, row.data());
  }
  png_write_end(png, nullptr);
  png_destroy_write_struct(&png, &info);
  return true;
}

// ---- JPEG ----

struct JpegError {
  jpeg_error_mgr manager;
  std::jmp_buf jump;
  char message[JMSG_LENGTH_MAX];
};

void JpegErrorExit(j_common_ptr info) {
  auto* e = reinterpret_cast<JpegError*>(info->err);
  e->manager.format_message(info, e->message);
  std::longjmp(e->jump, 1);
}
void JpegQuiet(j_common_ptr, int) {}

// Decodes straight into the picture, row by row. The picture is made here once the
// size is known; plain data only beyond the setjmp.
bool DecodeJpeg(std::FILE* f, host::Runtime& rt, host::Object* picture, ImageExtras* x, JpegError* error,
                bool* cmyk) {
  jpeg_decompress_struct info;
  info.err = jpeg_std_error(&error->manager);
  error->manager.error_exit = JpegErrorExit;
  error->manager.emit_message = JpegQuiet;
  std::vector<JSAMPLE> row;
  if (setjmp(error->jump)) {
    jpeg_destroy_decompress(&info);
    return false;
  }
  jpeg_create_decompress(&info);
  jpeg_stdio_src(&info, f);
  jpeg_save_markers(&info, JPEG_APP0 + 2, 0xFFFF);
  jpeg_read_header(&info, TRUE);
  JOCTET* profile = nullptr;
  unsigned profileLength = 0;
  if (jpeg_read_icc_profile(&info, &profile, &profileLength) && profile) {
    x->icc.assign(profile, profile + profileLength);
    std::free(profile);
  }
  if (info.jpeg_color_space == JCS_CMYK || info.jpeg_color_space == JCS_YCCK) {
    *cmyk = true;
    jpeg_destroy_decompress(&info);
    return false;
  }
  x->gray = info.jpeg_color_space == JCS_GRAYSCALE;
  info.out_color_space = JCS_RGB;
  jpeg_start_decompress(&info);
  if (static_cast<std::uint64_t>(info.output_width) * info.output_height > kMaxPixels) {
    std::snprintf(error->message, sizeof error->message, "image too large for a picture");
    jpeg_destroy_decompress(&info);
    return false;
  }
  x->width = static_cast<int>(info.output_width);
  x->height = static_cast<int>(info.output_height);
  *picture = rt.NewPicture(x->width, x->height);
  std::uint32_t* out = rt.PicturePixels(*picture);
  row.resize(static_cast<std::size_t>(info.output_width) * 3);
  JSAMPROW rows[1] = {row.data()};
  while (info.output_scanline < info.output_height) {
    const std::size_t y = info.output_scanline;
    jpeg_read_scanlines(&info, rows, 1);
    std::uint32_t* line = out + y * info.output_width;
    for (JDIMENSION i = 0; i < info.output_width; ++i)
      line[i] = static_cast<std::uint32_t>(row[3 * i]) << 16 | static_cast<std::uint32_t>(row[3 * i + 1]) << 8 |
                row[3 * i + 2];
  }
  jpeg_finish_decompress(&info);
  jpeg_destroy_decompress(&info);
  return true;
}

bool EncodeJpeg(std::FILE* f, const std::uint32_t* pixels, const ImageExtras& x, const std::vector<std::uint8_t>& icc,
                JpegError* error) {
  jpeg_compress_struct info;
  info.err = jpeg_std_error(&error->manager);
  error->manager.error_exit = JpegErrorExit;
  error->manager.emit_message = JpegQuiet;
  std::vector<JSAMPLE> row(static_cast<std::size_t>(x.width) * 3);
  if (setjmp(error->jump)) {
    jpeg_destroy_compress(&info);
    return false;
  }
  jpeg_create_compress(&info);
  jpeg_stdio_dest(&info, f);
  info.image_width = static_cast<JDIMENSION>(x.width);
  info.image_height = static_cast<JDIMENSION>(x.height);
  info.input_components = 3;
  info.in_color_space = JCS_RGB;
  jpeg_set_defaults(&info);
  jpeg_set_quality(&info, 95, TRUE);
  jpeg_start_compress(&info, TRUE);
  if (!icc.empty()) jpeg_write_icc_profile(&info, icc.data(), static_cast<unsigned>(icc.size()));
  JSAMPROW rows[1] = {row.data()};
  while (info.next_scanline < info.image_height) {
    const std::uint32_t* line = pixels + static_cast<std::size_t>(info.next_scanline) * static_cast<std::size_t>(x.width);
    for (int i = 0; i < x.width; ++i) {
      row[3 * i] = static_cast<JSAMPLE>(line[i] >> 16);
      row[3 * i + 1] = static_cast<JSAMPLE>(line[i] >> 8);
      row[3 * i + 2] = static_cast<JSAMPLE>(line[i]);
    }
    jpeg_write_scanlines(&info, rows, 1);
  }
  jpeg_finish_compress(&info);
  jpeg_destroy_compress(&info);
  return true;
}

}  // namespace

bool FormatFromName(const std::string& path, ImageFormat* format) {
  const std::size_t dot = path.rfind('.');
  if (dot == std::string::npos || path.find('/', dot) != std::string::npos) return false;
  const std::string ext = Lower(path.substr(dot + 1));
  if (ext == "png") *format = ImageFormat::Png;
  else if (ext == "jpg" || ext == "jpeg") *format = ImageFormat::Jpeg;
  else return false;
  return true;
}

host::Object ReadImage(host::Runtime& rt, const std::string& path, ImageExtras* extras) {
  File f(std::fopen(path.c_str(), "rb"));
  if (!f) throw JobError("cannot open " + path + ": " + std::strerror(errno), 0);
  unsigned char magic[8] = {};
  const std::size_t got = std::fread(magic, 1, sizeof magic, f.get());
  std::rewind(f.get());
  *extras = ImageExtras{};
  if (got == sizeof magic && png_sig_cmp(magic, 0, sizeof magic) == 0) {
    std::vector<png_byte> pixels;
    PngReadState state;
    if (!DecodePng(f.get(), &pixels, extras, &state)) throw JobError(path + ": not a readable PNG: " + state.message, 0);
    host::Object picture;
    try {
      picture = rt.NewPicture(extras->width, extras->height);
    } catch (const host::HostError&) {
      throw JobError(path + ": the image is too large for a picture", 0);
    }
    FillFromPng(rt, picture, pixels, extras);
    return picture;
  }
  if (got >= 3 && magic[0] == 0xFF && magic[1] == 0xD8 && magic[2] == 0xFF) {
    host::Object picture;
    JpegError error{};
    bool cmyk = false;
    bool ok = false;
    try {
      ok = DecodeJpeg(f.get(), rt, &picture, extras, &error, &cmyk);
    } catch (const host::HostError&) {
      throw JobError(path + ": the image is too large for a picture", 0);
    }
    if (cmyk) throw JobError(path + ": CMYK JPEG files are not supported (pictures are RGB)", 0);
    if (!ok) throw JobError(path + ": not a readable JPEG: " + error.message, 0);
    extras->depth = 8;
    return picture;
  }
  throw JobError(path + ": neither a PNG nor a JPEG file", 0);
}

void WriteImage(host::Runtime& rt, const host::Object& picture, const ImageExtras& extras, ImageFormat format,
                const std::string& path, const std::vector<std::uint8_t>& icc) {
  // Beside the destination, then renamed over it: a failure leaves any old file intact.
  const std::string temporary = path + ".tmp-" + std::to_string(getpid());
  File f(std::fopen(temporary.c_str(), "wb"));
  if (!f) throw JobError("cannot write " + path + ": " + std::strerror(errno), 0);
  const std::uint32_t* pixels = rt.PicturePixels(picture);
  bool ok;
  std::string why;
  if (format == ImageFormat::Png) {
    PngReadState state;
    ok = EncodePng(f.get(), pixels, extras, icc, &state);
    why = state.message;
  } else {
    JpegError error{};
    ok = EncodeJpeg(f.get(), pixels, extras, icc, &error);
    why = error.message;
  }
  if (ok && (std::fflush(f.get()) != 0 || std::ferror(f.get()))) ok = false, why = std::strerror(errno);
  std::FILE* raw = f.release();
  if (std::fclose(raw) != 0 && ok) ok = false, why = std::strerror(errno);
  if (ok && std::rename(temporary.c_str(), path.c_str()) != 0) ok = false, why = std::strerror(errno);
  if (!ok) {
    unlink(temporary.c_str());
    throw JobError("cannot write " + path + (why.empty() ? "" : ": " + why), 0);
  }
}

}  // namespace tool
