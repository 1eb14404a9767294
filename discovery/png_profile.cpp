// PNG: the profile is the zlib-compressed iCCP chunk. Reading goes through libpng, which
// decompresses the profile no further than the limit set on it; embedding copies every
// chunk as it is, with a new iCCP after IHDR in place of any iCCP or sRGB chunk.
#include <png.h>
#include <zlib.h>

#include <csetjmp>
#include <cstring>

#include "image_formats.h"

namespace image {

namespace {

constexpr std::uint32_t kIHDR = 0x49484452, kIEND = 0x49454E44, kiCCP = 0x69434350, ksRGB = 0x73524742;

std::uint32_t BE32(const std::uint8_t* p) {
  return (std::uint32_t{p[0]} << 24) | (std::uint32_t{p[1]} << 16) | (std::uint32_t{p[2]} << 8) | p[3];
}
void PutBE32(Bytes& out, std::uint32_t v) {
  for (int shift = 24; shift >= 0; shift -= 8) out.push_back(static_cast<std::uint8_t>(v >> shift));
}

struct Chunk {
  std::uint32_t type;
  std::size_t offset;  // of the length field
  std::size_t length;  // of the data
};

// The chunks from the signature to IEND, each complete and matching its CRC; false for
// anything else. Bytes after IEND are not part of the image.
bool WalkChunks(const std::uint8_t* data, std::size_t size, std::vector<Chunk>& chunks) {
  if (size < 8) return false;
  std::size_t at = 8;
  for (;;) {
    if (size - at < 12) return false;
    const std::size_t length = BE32(data + at);
    if (length > 0x7FFFFFFFu || length > size - at - 12) return false;
    const std::uint32_t type = BE32(data + at + 4);
    const uLong crc = crc32(crc32(0L, Z_NULL, 0), data + at + 4, static_cast<uInt>(length + 4));
    if (crc != BE32(data + at + 8 + length)) return false;
    if (chunks.empty() && type != kIHDR) return false;
    chunks.push_back(Chunk{type, at, length});
    at += 12 + length;
    if (type == kIEND) return true;
  }
}

struct Reader {
  const std::uint8_t* data;
  std::size_t size;
  std::size_t at;
};

void ReadFromMemory(png_structp png, png_bytep out, png_size_t count) {
  Reader* r = static_cast<Reader*>(png_get_io_ptr(png));
  if (count > r->size - r->at) png_error(png, "truncated");
  std::memcpy(out, r->data + r->at, count);
  r->at += count;
}

void OnError(png_structp png, png_const_charp) { png_longjmp(png, 1); }
void OnWarning(png_structp, png_const_charp) {}

// Reads the header chunks up to the image data; the profile, when libpng accepts one,
// goes into info. False when libpng refuses the image.
bool ReadInfo(const std::uint8_t* data, std::size_t size, ImageInfo& info) {
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, OnError, OnWarning);
  if (png == nullptr) return false;
  png_infop pinfo = png_create_info_struct(png);
  Reader reader{data, size, 0};
  bool ok = false;
  if (pinfo != nullptr && setjmp(png_jmpbuf(png)) == 0) {
    png_set_read_fn(png, &reader, ReadFromMemory);
    // The profile's declared length is checked against this before it is inflated.
    png_set_chunk_malloc_max(png, kMaxProfileBytes);
    png_read_info(png, pinfo);
    const int colorType = png_get_color_type(png, pinfo);
    std::memcpy(info.space, (colorType & PNG_COLOR_MASK_COLOR) ? "RGB " : "GRAY", 5);
    png_charp name = nullptr;
    int compression = 0;
    png_bytep profile = nullptr;
    png_uint_32 length = 0;
    if (png_get_iCCP(png, pinfo, &name, &compression, &profile, &length) & PNG_INFO_iCCP) {
      info.hasProfile = true;
      info.profile.assign(profile, profile + length);
    }
    ok = true;
  }
  png_destroy_read_struct(&png, pinfo ? &pinfo : nullptr, nullptr);
  return ok;
}

}  // namespace

bool ReadPng(const std::uint8_t* data, std::size_t size, ImageInfo& info) {
  std::vector<Chunk> chunks;
  if (!WalkChunks(data, size, chunks) || !ReadInfo(data, size, info)) return false;
  // An iCCP chunk that libpng would not take (too large, damaged, wrong for the image)
  // is a damaged image, not an image without a profile.
  bool iccp = false;
  for (const Chunk& c : chunks) iccp = iccp || c.type == kiCCP;
  return iccp == info.hasProfile;
}

bool EmbedPng(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out) {
  std::vector<Chunk> chunks;
  ImageInfo info;
  if (!WalkChunks(data, size, chunks) || !ReadInfo(data, size, info)) return false;

  // iCCP data: keyword, its terminator, compression method 0, the zlib stream.
  static const char kKeyword[] = "ICC profile";
  Bytes iccp(kKeyword, kKeyword + sizeof kKeyword);
  iccp.push_back(0);
  uLongf packed = compressBound(static_cast<uLong>(profile.size()));
  const std::size_t head = iccp.size();
  iccp.resize(head + packed);
  if (compress2(iccp.data() + head, &packed, profile.data(), static_cast<uLong>(profile.size()), 9) != Z_OK)
    return false;
  iccp.resize(head + packed);

  out.clear();
  out.reserve(size + iccp.size() + 12);
  out.insert(out.end(), data, data + 8);
  for (std::size_t i = 0; i < chunks.size(); ++i) {
    const Chunk& c = chunks[i];
    if (c.type == kiCCP || c.type == ksRGB) continue;
    out.insert(out.end(), data + c.offset, data + c.offset + 12 + c.length);
    if (i == 0) {  // right after IHDR, before any palette or image data
      PutBE32(out, static_cast<std::uint32_t>(iccp.size()));
      const std::size_t typeAt = out.size();
      PutBE32(out, kiCCP);
      out.insert(out.end(), iccp.begin(), iccp.end());
      PutBE32(out, static_cast<std::uint32_t>(
                       crc32(crc32(0L, Z_NULL, 0), out.data() + typeAt, static_cast<uInt>(out.size() - typeAt))));
    }
  }
  return true;
}

}  // namespace image
