#include "image_files.h"

#include <png.h>
#include <stdio.h>  // before jpeglib.h, which uses FILE and size_t without including them
#include <jpeglib.h>
#if TINTWELL_IMAGE_FILES
#include <tiffio.h>
#endif

#include <cstdlib>
#include <fstream>
#include <iterator>

namespace testimage {

Image Patterned(int width, int height, int channels, const Bytes& icc) {
  Image im;
  im.width = width, im.height = height, im.channels = channels, im.icc = icc;
  for (int y = 0; y < height; ++y)
    for (int x = 0; x < width; ++x)
      for (int c = 0; c < channels; ++c) im.samples.push_back(static_cast<std::uint8_t>(x * 7 + y * 13 + c * 61));
  return im;
}

// One row of samples as bytes, big-endian at depth 16.
static Bytes Row(const Image& im, int y) {
  const std::size_t n = static_cast<std::size_t>(im.width) * im.channels, bytes = im.depth / 8;
  Bytes row(n * bytes);
  for (std::size_t i = 0; i < n; ++i) {
    const std::uint32_t v = im.samples[y * n + i];
    if (bytes == 2) row[2 * i] = static_cast<std::uint8_t>(v >> 8), row[2 * i + 1] = static_cast<std::uint8_t>(v);
    else row[i] = static_cast<std::uint8_t>(v);
  }
  return row;
}

static void AddRow(Image& im, const std::uint8_t* row) {
  for (int i = 0; i < im.width * im.channels; ++i)
    im.samples.push_back(im.depth == 16 ? static_cast<std::uint32_t>(row[2 * i] << 8 | row[2 * i + 1]) : row[i]);
}

void WritePng(const std::string& path, const Image& im) {
  FILE* f = fopen(path.c_str(), "wb");
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  png_init_io(png, f);
  const int types[] = {0, PNG_COLOR_TYPE_GRAY, PNG_COLOR_TYPE_GRAY_ALPHA, PNG_COLOR_TYPE_RGB, PNG_COLOR_TYPE_RGBA};
  png_set_IHDR(png, info, im.width, im.height, im.depth, types[im.channels], PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (!im.icc.empty()) png_set_iCCP(png, info, "icc", 0, im.icc.data(), static_cast<png_uint_32>(im.icc.size()));
  png_text text{};
  text.compression = PNG_TEXT_COMPRESSION_NONE;
  text.key = const_cast<char*>("Comment");
  text.text = const_cast<char*>("kept");
  png_set_text(png, info, &text, 1);
  png_write_info(png, info);
  for (int y = 0; y < im.height; ++y) png_write_row(png, Row(im, y).data());
  png_write_end(png, info);
  png_destroy_write_struct(&png, &info);
  fclose(f);
}

Image ReadPng(const std::string& path) {
  Image im;
  FILE* f = fopen(path.c_str(), "rb");
  if (!f) return im;
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  if (setjmp(png_jmpbuf(png)) == 0) {
    png_init_io(png, f);
    png_read_info(png, info);
    im.width = static_cast<int>(png_get_image_width(png, info));
    im.height = static_cast<int>(png_get_image_height(png, info));
    im.depth = png_get_bit_depth(png, info);
    im.channels = png_get_channels(png, info);
    png_charp name;
    int compression;
    png_bytep profile;
    png_uint_32 length;
    if (png_get_iCCP(png, info, &name, &compression, &profile, &length)) im.icc.assign(profile, profile + length);
    Bytes row(png_get_rowbytes(png, info));
    for (int y = 0; y < im.height; ++y) png_read_row(png, row.data(), nullptr), AddRow(im, row.data());
    png_read_end(png, nullptr);
    im.ok = true;
  }
  png_destroy_read_struct(&png, &info, nullptr);
  fclose(f);
  return im;
}

void WriteJpeg(const std::string& path, const Image& im, const std::vector<Bytes>& rawIcc) {
  FILE* f = fopen(path.c_str(), "wb");
  jpeg_compress_struct c;
  jpeg_error_mgr err;
  c.err = jpeg_std_error(&err);
  jpeg_create_compress(&c);
  jpeg_stdio_dest(&c, f);
  c.image_width = im.width;
  c.image_height = im.height;
  c.input_components = im.channels;
  c.in_color_space = im.channels == 1 ? JCS_GRAYSCALE : im.channels == 3 ? JCS_RGB : JCS_CMYK;
  jpeg_set_defaults(&c);
  jpeg_set_quality(&c, 90, TRUE);
  jpeg_start_compress(&c, TRUE);
  if (!im.icc.empty()) jpeg_write_icc_profile(&c, im.icc.data(), static_cast<unsigned>(im.icc.size()));
  for (const Bytes& m : rawIcc) jpeg_write_marker(&c, JPEG_APP0 + 2, m.data(), static_cast<unsigned>(m.size()));
  jpeg_write_marker(&c, JPEG_COM, reinterpret_cast<const JOCTET*>("kept"), 4);
  for (int y = 0; y < im.height; ++y) {
    Bytes row = Row(im, y);
    JSAMPROW rows[1] = {row.data()};
    jpeg_write_scanlines(&c, rows, 1);
  }
  jpeg_finish_compress(&c);
  jpeg_destroy_compress(&c);
  fclose(f);
}

Image ReadJpeg(const std::string& path) {
  Image im;
  FILE* f = fopen(path.c_str(), "rb");
  if (!f) return im;
  jpeg_decompress_struct c;
  jpeg_error_mgr err;
  c.err = jpeg_std_error(&err);
  jpeg_create_decompress(&c);
  jpeg_stdio_src(&c, f);
  jpeg_save_markers(&c, JPEG_APP0 + 2, 0xFFFF);
  jpeg_read_header(&c, TRUE);
  JOCTET* profile = nullptr;
  unsigned length = 0;
  if (jpeg_read_icc_profile(&c, &profile, &length)) im.icc.assign(profile, profile + length), free(profile);
  jpeg_start_decompress(&c);
  im.width = static_cast<int>(c.output_width), im.height = static_cast<int>(c.output_height);
  im.channels = c.output_components;
  Bytes row(static_cast<std::size_t>(im.width) * im.channels);
  while (c.output_scanline < c.output_height) {
    JSAMPROW rows[1] = {row.data()};
    jpeg_read_scanlines(&c, rows, 1);
    AddRow(im, row.data());
  }
  jpeg_finish_decompress(&c);
  jpeg_destroy_decompress(&c);
  fclose(f);
  im.ok = true;
  return im;
}

#if TINTWELL_IMAGE_FILES
void WriteTiff(const std::string& path, const Image& im, bool big) {
  TIFF* t = TIFFOpen(path.c_str(), big ? "w8b" : "w");
  TIFFSetField(t, TIFFTAG_IMAGEWIDTH, im.width);
  TIFFSetField(t, TIFFTAG_IMAGELENGTH, im.height);
  TIFFSetField(t, TIFFTAG_BITSPERSAMPLE, 8);
  TIFFSetField(t, TIFFTAG_SAMPLESPERPIXEL, im.channels);
  TIFFSetField(t, TIFFTAG_PHOTOMETRIC, im.channels == 1   ? PHOTOMETRIC_MINISBLACK
                                       : im.channels == 3 ? PHOTOMETRIC_RGB
                                                          : PHOTOMETRIC_SEPARATED);
  TIFFSetField(t, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
  TIFFSetField(t, TIFFTAG_COMPRESSION, COMPRESSION_LZW);
  TIFFSetField(t, TIFFTAG_PREDICTOR, 2);
  TIFFSetField(t, TIFFTAG_ROWSPERSTRIP, 5);
  TIFFSetField(t, TIFFTAG_IMAGEDESCRIPTION, "kept");
  if (!im.icc.empty()) TIFFSetField(t, TIFFTAG_ICCPROFILE, static_cast<std::uint32_t>(im.icc.size()), im.icc.data());
  for (int y = 0; y < im.height; ++y) TIFFWriteScanline(t, Row(im, y).data(), y, 0);
  TIFFClose(t);
}

Image ReadTiff(const std::string& path) {
  Image im;
  TIFFSetErrorHandler(nullptr);
  TIFFSetWarningHandler(nullptr);
  TIFF* t = TIFFOpen(path.c_str(), "r");
  if (!t) return im;
  std::uint32_t count = 0, w = 0, h = 0;
  void* profile = nullptr;
  if (TIFFGetField(t, TIFFTAG_ICCPROFILE, &count, &profile))
    im.icc.assign(static_cast<const std::uint8_t*>(profile), static_cast<const std::uint8_t*>(profile) + count);
  TIFFGetField(t, TIFFTAG_IMAGEWIDTH, &w), TIFFGetField(t, TIFFTAG_IMAGELENGTH, &h);
  Bytes row(static_cast<std::size_t>(TIFFScanlineSize(t)));
  im.width = static_cast<int>(row.size()), im.channels = 1, im.ok = true;  // samples kept as bytes
  for (std::uint32_t y = 0; y < h; ++y) {
    if (TIFFReadScanline(t, row.data(), y, 0) < 0) im.ok = false;
    AddRow(im, row.data());
  }
  im.height = static_cast<int>(h);
  TIFFClose(t);
  return im;
}
#endif

void Make(Kind kind, const std::string& path, int width, int height, int channels, const Bytes& profile,
          const std::vector<Bytes>& rawIcc) {
  const Image im = Patterned(width, height, channels, profile);
  switch (kind) {
    case Kind::Png: return WritePng(path, im);
    case Kind::Jpeg: return WriteJpeg(path, im, rawIcc);
#if TINTWELL_IMAGE_FILES
    case Kind::Tiff:
    case Kind::BigTiff: return WriteTiff(path, im, kind == Kind::BigTiff);
#else
    default: break;
#endif
  }
}

Image Read(Kind kind, const std::string& path) {
  switch (kind) {
    case Kind::Png: return ReadPng(path);
    case Kind::Jpeg: return ReadJpeg(path);
#if TINTWELL_IMAGE_FILES
    case Kind::Tiff:
    case Kind::BigTiff: return ReadTiff(path);
#else
    default: break;
#endif
  }
  return {};
}

Bytes ReadFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return Bytes(std::istreambuf_iterator<char>(in), {});
}

void WriteFile(const std::string& path, const Bytes& bytes) {
  std::ofstream(path, std::ios::binary)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

}  // namespace testimage
