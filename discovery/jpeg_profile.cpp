// JPEG: the profile is split across APP2 markers, each starting "ICC_PROFILE\0", its
// sequence number (1 to n) and the count n. Reading takes the markers through libjpeg
// and accepts only a complete set; embedding copies the DCT coefficients and every other
// marker as they are, so no pixel is decoded or encoded again.
#include <stdio.h>  // jpeglib.h needs FILE
#include <stdlib.h>

#include <jpeglib.h>

#include <csetjmp>
#include <cstring>

#include "image_formats.h"

namespace image {

namespace {

constexpr int kApp2 = JPEG_APP0 + 2;
constexpr std::size_t kIccHead = 14;  // "ICC_PROFILE\0", sequence number, count
// The coefficients of an image are held in memory while it is copied; a header that
// claims more than this (a few bytes can claim 65535 x 65535 pixels) is refused rather
// than allocated. A 100-megapixel colour image needs about 300 MB.
constexpr long kMaxCoefficientMemory = 512L << 20;

// libjpeg's errors jump back to the call; its warnings (corrupt or missing data) are
// counted, and an embedding refuses an image that had any.
struct Errors {
  jpeg_error_mgr pub;
  std::jmp_buf jump;
  int warnings;
};

void OnError(j_common_ptr cinfo) { std::longjmp(reinterpret_cast<Errors*>(cinfo->err)->jump, 1); }
void OnMessage(j_common_ptr cinfo, int level) {
  if (level < 0) ++reinterpret_cast<Errors*>(cinfo->err)->warnings;
}
void OnOutput(j_common_ptr) {}

void InitErrors(Errors& errors) {
  jpeg_std_error(&errors.pub);
  errors.pub.error_exit = OnError;
  errors.pub.emit_message = OnMessage;
  errors.pub.output_message = OnOutput;
  errors.warnings = 0;
}

bool IsIccMarker(const jpeg_saved_marker_ptr m) {
  return m->marker == kApp2 && m->data_length >= kIccHead && std::memcmp(m->data, "ICC_PROFILE\0", 12) == 0;
}

// Joins the profile's pieces in sequence order. True with no profile when there are no
// pieces; false for an inconsistent set: counts that differ, a number outside 1 to the
// count, a number given twice or missing.
bool JoinProfile(jpeg_saved_marker_ptr markers, ImageInfo& info) {
  jpeg_saved_marker_ptr pieces[256] = {};
  unsigned count = 0, seen = 0;
  std::size_t total = 0;
  for (jpeg_saved_marker_ptr m = markers; m != nullptr; m = m->next) {
    if (!IsIccMarker(m)) continue;
    const unsigned sequence = m->data[12], n = m->data[13];
    if (seen == 0) count = n;
    if (n == 0 || n != count || sequence == 0 || sequence > count || pieces[sequence] != nullptr) return false;
    pieces[sequence] = m;
    ++seen;
    total += m->data_length - kIccHead;
  }
  if (seen == 0) return true;
  if (seen != count || total == 0 || total > kMaxProfileBytes) return false;
  info.profile.reserve(total);
  for (unsigned s = 1; s <= count; ++s)
    info.profile.insert(info.profile.end(), pieces[s]->data + kIccHead, pieces[s]->data + pieces[s]->data_length);
  info.hasProfile = true;
  return true;
}

const char* SpaceOf(J_COLOR_SPACE space) {
  switch (space) {
    case JCS_GRAYSCALE: return "GRAY";
    case JCS_CMYK:
    case JCS_YCCK: return "CMYK";
    default: return "RGB ";
  }
}

}  // namespace

// The structures start zeroed, so that destroying one whose creation failed is safe.
bool ReadJpeg(const std::uint8_t* data, std::size_t size, ImageInfo& info) {
  jpeg_decompress_struct src{};
  Errors errors;
  InitErrors(errors);
  src.err = &errors.pub;
  bool ok = false;
  if (setjmp(errors.jump) == 0) {
    jpeg_create_decompress(&src);
    jpeg_mem_src(&src, data, static_cast<unsigned long>(size));
    jpeg_save_markers(&src, kApp2, 0xFFFF);
    jpeg_read_header(&src, TRUE);
    std::memcpy(info.space, SpaceOf(src.jpeg_color_space), 5);
    ok = JoinProfile(src.marker_list, info);
  }
  jpeg_destroy_decompress(&src);
  return ok;
}

bool EmbedJpeg(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out) {
  jpeg_decompress_struct src{};
  jpeg_compress_struct dst{};
  Errors errors;
  InitErrors(errors);
  src.err = &errors.pub;
  dst.err = &errors.pub;
  unsigned char* buffer = nullptr;
  unsigned long length = 0;
  bool ok = false;
  if (setjmp(errors.jump) == 0) {
    jpeg_create_decompress(&src);
    jpeg_create_compress(&dst);
    src.mem->max_memory_to_use = kMaxCoefficientMemory;
    jpeg_mem_src(&src, data, static_cast<unsigned long>(size));
    jpeg_save_markers(&src, JPEG_COM, 0xFFFF);
    for (int m = 0; m < 16; ++m) jpeg_save_markers(&src, JPEG_APP0 + m, 0xFFFF);
    jpeg_read_header(&src, TRUE);
    jvirt_barray_ptr* coefficients = jpeg_read_coefficients(&src);
    if (errors.warnings == 0) {
      jpeg_copy_critical_parameters(&src, &dst);
      // The source's own JFIF and Adobe markers are copied below as they are.
      dst.write_JFIF_header = FALSE;
      dst.write_Adobe_marker = FALSE;
      if (src.progressive_mode) jpeg_simple_progression(&dst);
      jpeg_mem_dest(&dst, &buffer, &length);
      jpeg_write_coefficients(&dst, coefficients);
      // APP0 and APP1 (JFIF, Exif) first, then the profile, then the other markers.
      for (jpeg_saved_marker_ptr m = src.marker_list; m != nullptr; m = m->next)
        if (m->marker <= JPEG_APP0 + 1)
          jpeg_write_marker(&dst, m->marker, m->data, m->data_length);
      jpeg_write_icc_profile(&dst, profile.data(), static_cast<unsigned int>(profile.size()));
      for (jpeg_saved_marker_ptr m = src.marker_list; m != nullptr; m = m->next)
        if (m->marker > JPEG_APP0 + 1 && !IsIccMarker(m))
          jpeg_write_marker(&dst, m->marker, m->data, m->data_length);
      jpeg_finish_compress(&dst);
      jpeg_finish_decompress(&src);
      ok = errors.warnings == 0;
    }
  }
  jpeg_destroy_compress(&dst);
  jpeg_destroy_decompress(&src);
  if (ok) out.assign(buffer, buffer + length);
  free(buffer);
  return ok;
}

}  // namespace image
