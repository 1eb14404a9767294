// TIFF: the profile is tag 34675 (InterColorProfile) of an image directory. Files are
// read and written by libtiff over memory streams. Embedding copies each directory's
// baseline tags and its strips or tiles as they are stored (no decoding) and gives every
// directory the new profile; tags outside the table below (private and EXIF
// sub-directories among them) are not carried over.
#include <tiffio.h>

#include <cstdarg>
#include <cstring>
#include <memory>

#include "image_formats.h"

namespace image {

namespace {

// A file in memory: read from the source bytes, or written into out.
struct Stream {
  const std::uint8_t* data;
  std::uint64_t size;
  Bytes* out;  // null when reading
  std::uint64_t at;
};

tmsize_t ReadProc(thandle_t h, void* buffer, tmsize_t count) {
  Stream* s = static_cast<Stream*>(h);
  const std::uint64_t length = s->out ? s->out->size() : s->size;
  const std::uint8_t* data = s->out ? s->out->data() : s->data;
  if (count < 0 || s->at >= length) return 0;
  const std::uint64_t n = std::min<std::uint64_t>(static_cast<std::uint64_t>(count), length - s->at);
  std::memcpy(buffer, data + s->at, static_cast<std::size_t>(n));
  s->at += n;
  return static_cast<tmsize_t>(n);
}

tmsize_t WriteProc(thandle_t h, void* buffer, tmsize_t count) {
  Stream* s = static_cast<Stream*>(h);
  if (s->out == nullptr || count < 0) return -1;
  const std::uint64_t end = s->at + static_cast<std::uint64_t>(count);
  if (end > kMaxImageBytes) return -1;
  try {
    if (end > s->out->size()) s->out->resize(static_cast<std::size_t>(end));
  } catch (...) {
    return -1;
  }
  std::memcpy(s->out->data() + s->at, buffer, static_cast<std::size_t>(count));
  s->at = end;
  return count;
}

toff_t SeekProc(thandle_t h, toff_t offset, int whence) {
  Stream* s = static_cast<Stream*>(h);
  const std::uint64_t length = s->out ? s->out->size() : s->size;
  std::uint64_t base = whence == SEEK_CUR ? s->at : whence == SEEK_END ? length : 0;
  if (offset > kMaxImageBytes || base + offset > kMaxImageBytes) return static_cast<toff_t>(-1);
  s->at = base + offset;
  return s->at;
}

int CloseProc(thandle_t) { return 0; }
toff_t SizeProc(thandle_t h) {
  Stream* s = static_cast<Stream*>(h);
  return s->out ? s->out->size() : s->size;
}
int MapProc(thandle_t, void**, toff_t*) { return 0; }
void UnmapProc(thandle_t, void*, toff_t) {}

int Quiet(TIFF*, void* failed, const char*, const char*, va_list) {
  if (failed) *static_cast<bool*>(failed) = true;
  return 1;  // handled: nothing reaches libtiff's global handlers
}

struct TiffCloser {
  void operator()(TIFF* tif) const { TIFFClose(tif); }
};
using TiffPtr = std::unique_ptr<TIFF, TiffCloser>;

// Opens the stream; every error sets *failed. Allocation inside libtiff is capped.
TiffPtr Open(Stream& stream, const char* mode, bool* failed) {
  TIFFOpenOptions* options = TIFFOpenOptionsAlloc();
  if (options == nullptr) return nullptr;
  TIFFOpenOptionsSetMaxSingleMemAlloc(options, static_cast<tmsize_t>(kMaxImageBytes));
  TIFFOpenOptionsSetErrorHandlerExtR(options, Quiet, failed);
  TIFFOpenOptionsSetWarningHandlerExtR(options, Quiet, nullptr);
  TIFF* tif = TIFFClientOpenExt("image", mode, &stream, ReadProc, WriteProc, SeekProc, CloseProc, SizeProc,
                                MapProc, UnmapProc, options);
  TIFFOpenOptionsFree(options);
  return TiffPtr(tif);
}

const char* SpaceOf(TIFF* tif) {
  std::uint16_t photometric = PHOTOMETRIC_RGB;
  TIFFGetFieldDefaulted(tif, TIFFTAG_PHOTOMETRIC, &photometric);
  switch (photometric) {
    case PHOTOMETRIC_MINISWHITE:
    case PHOTOMETRIC_MINISBLACK: return "GRAY";
    case PHOTOMETRIC_SEPARATED: return "CMYK";
    default: return "RGB ";
  }
}

// Tags copied as they are, by the way libtiff hands them over.
enum class Kind { U16, U32, Float, Text, Bytes32, U16Pair };
struct TagCopy {
  ttag_t tag;
  Kind kind;
};
const TagCopy kTags[] = {
    {TIFFTAG_SUBFILETYPE, Kind::U32},        {TIFFTAG_IMAGEWIDTH, Kind::U32},
    {TIFFTAG_IMAGELENGTH, Kind::U32},        {TIFFTAG_BITSPERSAMPLE, Kind::U16},
    {TIFFTAG_COMPRESSION, Kind::U16},        {TIFFTAG_PHOTOMETRIC, Kind::U16},
    {TIFFTAG_THRESHHOLDING, Kind::U16},      {TIFFTAG_FILLORDER, Kind::U16},
    {TIFFTAG_DOCUMENTNAME, Kind::Text},      {TIFFTAG_IMAGEDESCRIPTION, Kind::Text},
    {TIFFTAG_MAKE, Kind::Text},              {TIFFTAG_MODEL, Kind::Text},
    {TIFFTAG_ORIENTATION, Kind::U16},        {TIFFTAG_SAMPLESPERPIXEL, Kind::U16},
    {TIFFTAG_ROWSPERSTRIP, Kind::U32},       {TIFFTAG_XRESOLUTION, Kind::Float},
    {TIFFTAG_YRESOLUTION, Kind::Float},      {TIFFTAG_PLANARCONFIG, Kind::U16},
    {TIFFTAG_PAGENAME, Kind::Text},          {TIFFTAG_XPOSITION, Kind::Float},
    {TIFFTAG_YPOSITION, Kind::Float},        {TIFFTAG_RESOLUTIONUNIT, Kind::U16},
    {TIFFTAG_PAGENUMBER, Kind::U16Pair},     {TIFFTAG_SOFTWARE, Kind::Text},
    {TIFFTAG_DATETIME, Kind::Text},          {TIFFTAG_ARTIST, Kind::Text},
    {TIFFTAG_HOSTCOMPUTER, Kind::Text},      {TIFFTAG_PREDICTOR, Kind::U16},
    {TIFFTAG_TILEWIDTH, Kind::U32},          {TIFFTAG_TILELENGTH, Kind::U32},
    {TIFFTAG_INKSET, Kind::U16},             {TIFFTAG_SAMPLEFORMAT, Kind::U16},
    {TIFFTAG_JPEGTABLES, Kind::Bytes32},     {TIFFTAG_YCBCRSUBSAMPLING, Kind::U16Pair},
    {TIFFTAG_YCBCRPOSITIONING, Kind::U16},   {TIFFTAG_COPYRIGHT, Kind::Text},
    {TIFFTAG_XMLPACKET, Kind::Bytes32},      {TIFFTAG_PHOTOSHOP, Kind::Bytes32},
};

bool CopyTag(TIFF* in, TIFF* out, const TagCopy& t) {
  switch (t.kind) {
    case Kind::U16: {
      std::uint16_t v;
      return !TIFFGetField(in, t.tag, &v) || TIFFSetField(out, t.tag, v);
    }
    case Kind::U32: {
      std::uint32_t v;
      return !TIFFGetField(in, t.tag, &v) || TIFFSetField(out, t.tag, v);
    }
    case Kind::Float: {
      float v;
      return !TIFFGetField(in, t.tag, &v) || TIFFSetField(out, t.tag, static_cast<double>(v));
    }
    case Kind::Text: {
      const char* v;
      return !TIFFGetField(in, t.tag, &v) || TIFFSetField(out, t.tag, v);
    }
    case Kind::Bytes32: {
      std::uint32_t count;
      void* v;
      return !TIFFGetField(in, t.tag, &count, &v) || TIFFSetField(out, t.tag, count, v);
    }
    case Kind::U16Pair: {
      std::uint16_t a, b;
      return !TIFFGetField(in, t.tag, &a, &b) || TIFFSetField(out, t.tag, a, b);
    }
  }
  return false;
}

// Tags whose values come as arrays sized by other tags.
bool CopyArrays(TIFF* in, TIFF* out) {
  std::uint16_t count;
  std::uint16_t* extra;
  if (TIFFGetField(in, TIFFTAG_EXTRASAMPLES, &count, &extra) && !TIFFSetField(out, TIFFTAG_EXTRASAMPLES, count, extra))
    return false;
  std::uint16_t *red, *green, *blue;
  if (TIFFGetField(in, TIFFTAG_COLORMAP, &red, &green, &blue) &&
      !TIFFSetField(out, TIFFTAG_COLORMAP, red, green, blue))
    return false;
  float* values;
  if (TIFFGetField(in, TIFFTAG_REFERENCEBLACKWHITE, &values) &&
      !TIFFSetField(out, TIFFTAG_REFERENCEBLACKWHITE, values))
    return false;
  if (TIFFGetField(in, TIFFTAG_YCBCRCOEFFICIENTS, &values) && !TIFFSetField(out, TIFFTAG_YCBCRCOEFFICIENTS, values))
    return false;
  return true;
}

// Copies the stored strips or tiles of the current directory, byte for byte.
bool CopyData(TIFF* in, TIFF* out, std::uint64_t inputSize) {
  const bool tiled = TIFFIsTiled(in) != 0;
  const std::uint32_t pieces = tiled ? TIFFNumberOfTiles(in) : TIFFNumberOfStrips(in);
  Bytes buffer;
  for (std::uint32_t i = 0; i < pieces; ++i) {
    int err = 0;
    const std::uint64_t count = TIFFGetStrileByteCountWithErr(in, i, &err);
    // A count the file cannot hold is refused before it sizes anything.
    if (err != 0 || count == 0 || count > inputSize) return false;
    buffer.resize(static_cast<std::size_t>(count));
    const tmsize_t n = tiled ? TIFFReadRawTile(in, i, buffer.data(), static_cast<tmsize_t>(count))
                             : TIFFReadRawStrip(in, i, buffer.data(), static_cast<tmsize_t>(count));
    if (n != static_cast<tmsize_t>(count)) return false;
    const tmsize_t written = tiled ? TIFFWriteRawTile(out, i, buffer.data(), n) : TIFFWriteRawStrip(out, i, buffer.data(), n);
    if (written != n) return false;
  }
  return true;
}

// Whether the first directory lists the profile tag, read straight from the bytes, so
// that a profile entry that libtiff drops as damaged (a count the file cannot hold, say)
// is told apart from no profile at all.
bool ListsProfileTag(const std::uint8_t* data, std::size_t size) {
  if (size < 8) return false;
  const bool little = data[0] == 'I';
  auto read = [&](std::uint64_t at, int bytes) -> std::uint64_t {
    std::uint64_t v = 0;
    for (int i = 0; i < bytes; ++i) v |= std::uint64_t{data[at + (little ? i : bytes - 1 - i)]} << (8 * i);
    return v;
  };
  const bool big = read(2, 2) == 43;
  const std::uint64_t header = big ? 16 : 8, countBytes = big ? 8 : 2, entryBytes = big ? 20 : 12;
  if (size < header) return false;
  const std::uint64_t ifd = big ? read(8, 8) : read(4, 4);
  if (ifd > size || size - ifd < countBytes) return false;
  const std::uint64_t entries = read(ifd, static_cast<int>(countBytes));
  if (entries > (size - ifd - countBytes) / entryBytes) return false;
  for (std::uint64_t i = 0; i < entries; ++i)
    if (read(ifd + countBytes + i * entryBytes, 2) == TIFFTAG_ICCPROFILE) return true;
  return false;
}

}  // namespace

bool ReadTiff(const std::uint8_t* data, std::size_t size, ImageInfo& info) {
  bool failed = false;
  Stream stream{data, size, nullptr, 0};
  TiffPtr tif = Open(stream, "rm", &failed);
  if (!tif || failed) return false;
  std::memcpy(info.space, SpaceOf(tif.get()), 5);
  std::uint32_t count = 0;
  void* profile = nullptr;
  if (TIFFGetField(tif.get(), TIFFTAG_ICCPROFILE, &count, &profile) && count != 0) {
    if (count > kMaxProfileBytes) return false;
    info.hasProfile = true;
    const auto* bytes = static_cast<const std::uint8_t*>(profile);
    info.profile.assign(bytes, bytes + count);
  }
  return !failed && info.hasProfile == ListsProfileTag(data, size);
}

bool EmbedTiff(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out) {
  bool failed = false;
  Stream source{data, size, nullptr, 0};
  TiffPtr in = Open(source, "rm", &failed);
  if (!in || failed) return false;
  static const std::uint16_t kRawCopyable[] = {COMPRESSION_NONE,     COMPRESSION_CCITTRLE, COMPRESSION_CCITTFAX3,
                                              COMPRESSION_CCITTFAX4, COMPRESSION_LZW,      COMPRESSION_JPEG,
                                              COMPRESSION_ADOBE_DEFLATE, COMPRESSION_DEFLATE, COMPRESSION_PACKBITS};
  out.clear();
  Stream target{nullptr, 0, &out, 0};
  const bool big = TIFFIsBigTIFF(in.get()) != 0;
  const bool bigEndian = TIFFIsBigEndian(in.get()) != 0;
  const char* mode = big ? (bigEndian ? "w8b" : "w8l") : (bigEndian ? "wb" : "wl");
  TiffPtr result = Open(target, mode, &failed);
  if (!result) return false;
  do {
    std::uint16_t compression = COMPRESSION_NONE;
    TIFFGetFieldDefaulted(in.get(), TIFFTAG_COMPRESSION, &compression);
    bool known = false;
    for (std::uint16_t c : kRawCopyable) known = known || c == compression;
    if (!known) return false;  // a scheme whose data needs more than its tags to read again
    for (const TagCopy& t : kTags)
      if (!CopyTag(in.get(), result.get(), t)) return false;
    if (!CopyArrays(in.get(), result.get()) ||
        !TIFFSetField(result.get(), TIFFTAG_ICCPROFILE, static_cast<std::uint32_t>(profile.size()), profile.data()) ||
        !CopyData(in.get(), result.get(), size) || failed || !TIFFWriteDirectory(result.get()))
      return false;
  } while (TIFFReadDirectory(in.get()));
  result.reset();  // closing writes the last of the file
  return !failed;
}

}  // namespace image
