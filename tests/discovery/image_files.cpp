#include "image_files.h"

#include <png.h>
#include <stdio.h>
#include <jpeglib.h>
#include <tiffio.h>

#include <fstream>
#include <iterator>

namespace testimage {

namespace {

std::uint8_t Pattern(int x, int y, int c) { return static_cast<std::uint8_t>(x * 7 + y * 13 + c * 61); }

void MakePng(const std::string& path, int w, int h, int channels, const Bytes& profile) {
  FILE* f = fopen(path.c_str(), "wb");
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  png_init_io(png, f);
  png_set_IHDR(png, info, w, h, 8, channels == 1 ? PNG_COLOR_TYPE_GRAY : PNG_COLOR_TYPE_RGB, PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (!profile.empty())
    png_set_iCCP(png, info, "icc", 0, profile.data(), static_cast<png_uint_32>(profile.size()));
  png_text text{};
  text.compression = PNG_TEXT_COMPRESSION_NONE;
  text.key = const_cast<char*>("Comment");
  text.text = const_cast<char*>("kept");
  png_set_text(png, info, &text, 1);
  png_write_info(png, info);
  Bytes row(static_cast<std::size_t>(w * channels));
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x)
      for (int c = 0; c < channels; ++c) row[x * channels + c] = Pattern(x, y, c);
    png_write_row(png, row.data());
  }
  png_write_end(png, info);
  png_destroy_write_struct(&png, &info);
  fclose(f);
}

Decoded ReadPng(const std::string& path) {
  Decoded d;
  FILE* f = fopen(path.c_str(), "rb");
  if (!f) return d;
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  if (setjmp(png_jmpbuf(png)) == 0) {
    png_init_io(png, f);
    png_read_info(png, info);
    png_charp name;
    int compression;
    png_bytep profile;
    png_uint_32 length;
    if (png_get_iCCP(png, info, &name, &compression, &profile, &length)) d.profile.assign(profile, profile + length);
    const std::size_t rowBytes = png_get_rowbytes(png, info);
    const png_uint_32 h = png_get_image_height(png, info);
    Bytes row(rowBytes);
    for (png_uint_32 y = 0; y < h; ++y) {
      png_read_row(png, row.data(), nullptr);
      d.pixels.insert(d.pixels.end(), row.begin(), row.end());
    }
    png_read_end(png, nullptr);
    d.ok = true;
  }
  png_destroy_read_struct(&png, &info, nullptr);
  fclose(f);
  return d;
}

void MakeJpeg(const std::string& path, int w, int h, int channels, const Bytes& profile,
              const std::vector<Bytes>& rawIcc) {
  FILE* f = fopen(path.c_str(), "wb");
  jpeg_compress_struct c;
  jpeg_error_mgr err;
  c.err = jpeg_std_error(&err);
  jpeg_create_compress(&c);
  jpeg_stdio_dest(&c, f);
  c.image_width = w;
  c.image_height = h;
  c.input_components = channels;
  c.in_color_space = channels == 1 ? JCS_GRAYSCALE : channels == 3 ? JCS_RGB : JCS_CMYK;
  jpeg_set_defaults(&c);
  jpeg_set_quality(&c, 90, TRUE);
  jpeg_start_compress(&c, TRUE);
  if (!profile.empty()) jpeg_write_icc_profile(&c, profile.data(), static_cast<unsigned>(profile.size()));
  for (const Bytes& m : rawIcc) jpeg_write_marker(&c, JPEG_APP0 + 2, m.data(), static_cast<unsigned>(m.size()));
  const char comment[] = "kept";
  jpeg_write_marker(&c, JPEG_COM, reinterpret_cast<const JOCTET*>(comment), 4);
  Bytes row(static_cast<std::size_t>(w * channels));
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x)
      for (int k = 0; k < channels; ++k) row[x * channels + k] = Pattern(x, y, k);
    JSAMPROW rows[1] = {row.data()};
    jpeg_write_scanlines(&c, rows, 1);
  }
  jpeg_finish_compress(&c);
  jpeg_destroy_compress(&c);
  fclose(f);
}

Decoded ReadJpeg(const std::string& path) {
  Decoded d;
  FILE* f = fopen(path.c_str(), "rb");
  if (!f) return d;
  jpeg_decompress_struct c;
  jpeg_error_mgr err;
  c.err = jpeg_std_error(&err);
  jpeg_create_decompress(&c);
  jpeg_stdio_src(&c, f);
  jpeg_save_markers(&c, JPEG_APP0 + 2, 0xFFFF);
  jpeg_read_header(&c, TRUE);
  JOCTET* profile = nullptr;
  unsigned length = 0;
  if (jpeg_read_icc_profile(&c, &profile, &length)) {
    d.profile.assign(profile, profile + length);
    free(profile);
  }
  jpeg_start_decompress(&c);
  Bytes row(static_cast<std::size_t>(c.output_width * c.output_components));
  while (c.output_scanline < c.output_height) {
    JSAMPROW rows[1] = {row.data()};
    jpeg_read_scanlines(&c, rows, 1);
    d.pixels.insert(d.pixels.end(), row.begin(), row.end());
  }
  jpeg_finish_decompress(&c);
  jpeg_destroy_decompress(&c);
  fclose(f);
  d.ok = true;
  return d;
}

void MakeTiff(const std::string& path, int w, int h, int channels, const Bytes& profile, bool big) {
  TIFF* t = TIFFOpen(path.c_str(), big ? "w8b" : "w");
  TIFFSetField(t, TIFFTAG_IMAGEWIDTH, w);
  TIFFSetField(t, TIFFTAG_IMAGELENGTH, h);
  TIFFSetField(t, TIFFTAG_BITSPERSAMPLE, 8);
  TIFFSetField(t, TIFFTAG_SAMPLESPERPIXEL, channels);
  TIFFSetField(t, TIFFTAG_PHOTOMETRIC,
               channels == 1 ? PHOTOMETRIC_MINISBLACK : channels == 3 ? PHOTOMETRIC_RGB : PHOTOMETRIC_SEPARATED);
  TIFFSetField(t, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
  TIFFSetField(t, TIFFTAG_COMPRESSION, COMPRESSION_LZW);
  TIFFSetField(t, TIFFTAG_PREDICTOR, 2);
  TIFFSetField(t, TIFFTAG_ROWSPERSTRIP, 5);
  TIFFSetField(t, TIFFTAG_IMAGEDESCRIPTION, "kept");
  if (!profile.empty()) TIFFSetField(t, TIFFTAG_ICCPROFILE, static_cast<std::uint32_t>(profile.size()), profile.data());
  Bytes row(static_cast<std::size_t>(w * channels));
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x)
      for (int c = 0; c < channels; ++c) row[x * channels + c] = Pattern(x, y, c);
    TIFFWriteScanline(t, row.data(), y, 0);
  }
  TIFFClose(t);
}

Decoded ReadTiff(const std::string& path) {
  Decoded d;
  TIFFSetErrorHandler(nullptr);
  TIFFSetWarningHandler(nullptr);
  TIFF* t = TIFFOpen(path.c_str(), "r");
  if (!t) return d;
  std::uint32_t count = 0;
  void* profile = nullptr;
  if (TIFFGetField(t, TIFFTAG_ICCPROFILE, &count, &profile)) {
    const auto* p = static_cast<const std::uint8_t*>(profile);
    d.profile.assign(p, p + count);
  }
  std::uint32_t h = 0;
  TIFFGetField(t, TIFFTAG_IMAGELENGTH, &h);
  Bytes row(static_cast<std::size_t>(TIFFScanlineSize(t)));
  d.ok = true;
  for (std::uint32_t y = 0; y < h; ++y) {
    if (TIFFReadScanline(t, row.data(), y, 0) < 0) d.ok = false;
    d.pixels.insert(d.pixels.end(), row.begin(), row.end());
  }
  TIFFClose(t);
  return d;
}

}  // namespace

void Make(Kind kind, const std::string& path, int width, int height, int channels, const Bytes& profile,
          const std::vector<Bytes>& rawIcc) {
  switch (kind) {
    case Kind::Png: MakePng(path, width, height, channels, profile); break;
    case Kind::Jpeg: MakeJpeg(path, width, height, channels, profile, rawIcc); break;
    case Kind::Tiff: MakeTiff(path, width, height, channels, profile, false); break;
    case Kind::BigTiff: MakeTiff(path, width, height, channels, profile, true); break;
  }
}

Decoded Read(Kind kind, const std::string& path) {
  switch (kind) {
    case Kind::Png: return ReadPng(path);
    case Kind::Jpeg: return ReadJpeg(path);
    case Kind::Tiff:
    case Kind::BigTiff: return ReadTiff(path);
  }
  return {};
}

Bytes ReadFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return Bytes(std::istreambuf_iterator<char>(in), {});
}

void WriteFile(const std::string& path, const Bytes& bytes) {
  std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()),
                                              static_cast<std::streamsize>(bytes.size()));
}

}  // namespace testimage
