// Texts: textType and textDescriptionType written and read, and the
// multiLocalizedUnicodeType of version 4 profiles read wherever a text or description
// is, as ASCII. Texts are bytes: no character set is converted, except that a
// multi-localised text's characters beyond ASCII become '?'.
#include <cstring>
#include <vector>

#include "debugger.h"
#include "error_state.h"
#include "tag_codecs.h"
#include "tag_io.h"

namespace {

constexpr char kUnexpectedType[] = "Unexpected tag type";
// Behind a description's ASCII text: the Unicode language code (4) and count (4), the
// ScriptCode code (2) and count (1) and the 67-byte Macintosh description, all zero.
constexpr DWORD kDescTail = 78;
constexpr uint32_t kMlucRecordSize = 12;
constexpr uint16_t kLanguageEn = 0x656E;  // 'en'
constexpr uint16_t kCountryUS = 0x5553;   // 'US'

// A tag's total size must fit the 32-bit size of an element; no text fed to a writer
// comes near it, yet a 32-bit size_t must not wrap.
bool FitsElement(uint64_t total) {
  if (total <= 0xFFFFFFFFu) return true;
  SendDebugString("Text too long for a tag");
  SetCMError(ERROR_INVALID_PARAMETER);
  return false;
}

// The text of a multiLocalizedUnicodeType: the en-US record, else the first, its UTF-16
// code units as ASCII up to the first zero unit; every other character (a surrogate pair
// counting as one) becomes '?'. With out null only the length is found. False when the
// record table or the chosen string lies outside the tag.
bool MlucText(const ByteReader& in, char* out, uint32_t* length) {
  uint32_t records = 0, recordSize = 0;
  if (!in.U32(8, &records) || !in.U32(12, &recordSize) || recordSize < kMlucRecordSize ||
      records > in.Remaining(16) / recordSize)
    return false;
  *length = 0;
  if (records == 0) return true;
  std::size_t chosen = 16;
  for (uint32_t i = 0; i < records; ++i) {
    const std::size_t at = 16 + static_cast<std::size_t>(i) * recordSize;
    uint16_t language = 0, country = 0;
    in.U16(at, &language);
    in.U16(at + 2, &country);
    if (language == kLanguageEn && country == kCountryUS) {
      chosen = at;
      break;
    }
  }
  uint32_t bytes = 0, offset = 0;
  in.U32(chosen + 4, &bytes);
  in.U32(chosen + 8, &offset);
  if (!in.Has(offset, bytes)) return false;
  uint32_t n = 0;
  for (uint32_t i = 0; i + 1 < bytes; i += 2) {
    uint16_t unit = 0;
    in.U16(offset + static_cast<std::size_t>(i), &unit);
    if (unit == 0) break;
    uint16_t next = 0;
    if (unit >= 0xD800 && unit < 0xDC00 && i + 3 < bytes && in.U16(offset + static_cast<std::size_t>(i) + 2, &next) &&
        next >= 0xDC00 && next < 0xE000)
      i += 2;  // the low half of the pair
    if (out) out[n] = unit < 0x80 ? static_cast<char>(unit) : '?';
    ++n;
  }
  *length = n;
  return true;
}

// A multi-localised text read through either reader: without a buffer the size to
// allocate (the text and a zero byte); with one, the text and a zero behind it, and
// the text's length. failure is the reader's own failure value.
int32_t ReadMluc(const ByteReader& in, char* buffer, int32_t failure) {
  uint32_t length = 0;
  if (!MlucText(in, nullptr, &length)) {
    RefuseTag("Localized text outside the tag");
    return failure;
  }
  if (!buffer) return static_cast<int32_t>(length) + 1;
  MlucText(in, buffer, &length);
  buffer[length] = '\0';
  return static_cast<int32_t>(length);
}

// Answers that are 32-bit counts: an element beyond 2 GB cannot be answered.
bool Answerable(const std::vector<uint8_t>& bytes, int32_t failure, int32_t* result) {
  if (bytes.size() <= 0x7FFFFFF0u) return true;
  RefuseTag("Tag too large to read");
  *result = failure;
  return false;
}

}  // namespace

void HALVO_ICMWriteTagText(HPROFILE profile, TAGTYPE tag, const char* text) {
  if (!text) text = "";
  TraceWriteBanner("--------> HALVO_ICMWriteTagText", tag);
  const uint64_t length = std::strlen(text);
  SendDebugDouble(static_cast<double>(length + 9));
  if (!FitsElement(length + 9)) return;
  TagWriter writer(profile, tag, static_cast<DWORD>(length + 9));
  if (!writer.PutTypeHeader(kTypeText, "SetColorProfileElement1 fail")) return;
  SendDebugDouble(static_cast<double>(length + 1));
  writer.Put(text, static_cast<DWORD>(length + 1), "SetColorProfileElement3 fail");
}

// Without a buffer, the size to allocate: for textType the whole element's size. With a
// buffer, what it received: for textType the bytes behind the type header (the stored
// terminating zero included), with a zero byte stored behind them.
int32_t HALVO_ICMReadTagText(HPROFILE profile, TAGTYPE tag, char* buffer) {
  std::vector<uint8_t> bytes;
  int32_t result = -1;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok || !Answerable(bytes, -1, &result)) return result;
  const ByteReader in(bytes.data(), bytes.size());
  switch (TagTypeOf(bytes)) {
    case kTypeText: {
      const std::size_t length = in.Remaining(8);
      if (length < 1) {
        RefuseTag("Data size is < 1");
        return -1;
      }
      if (!buffer) return static_cast<int32_t>(bytes.size());
      std::memcpy(buffer, in.At(8), length);
      buffer[length] = '\0';
      return static_cast<int32_t>(length);
    }
    case kTypeMluc: return ReadMluc(in, buffer, -1);
    default: RefuseTag(kUnexpectedType); return -1;
  }
}

void HALVO_ICMWriteTagDesc(HPROFILE profile, TAGTYPE tag, const char* text) {
  if (!text) text = "";
  TraceWriteBanner("--------> HALVO_ICMWriteTagDesc", tag);
  const uint64_t length = std::strlen(text);
  const uint64_t total = 12 + (length + 1) + kDescTail;
  SendDebugInteger(static_cast<int32_t>(length + 1));
  SendDebugDouble(static_cast<double>(total));
  if (!FitsElement(total)) return;
  TagWriter writer(profile, tag, static_cast<DWORD>(total));
  if (!writer.PutTypeHeader(kTypeDesc, "SetColorProfileElement1 fail") ||
      !writer.PutU32(static_cast<uint32_t>(length + 1), "SetColorProfileElement2 fail"))
    return;
  SendDebugDouble(static_cast<double>(length + 1));
  if (!writer.Put(text, static_cast<DWORD>(length + 1), "SetColorProfileElement3 fail")) return;
  static const uint8_t tail[kDescTail] = {};
  writer.Put(tail, kDescTail, "SetColorProfileElement3 fail");
}

// Without a buffer, the size to allocate: for textDescriptionType the ASCII count + 1.
// With a buffer, the text's length without its terminating zero (ASCII count - 1), its
// bytes and a zero behind them. 0 when the tag cannot be read.
int32_t HALVO_ICMReadTagDesc(HPROFILE profile, TAGTYPE tag, char* buffer) {
  std::vector<uint8_t> bytes;
  int32_t result = 0;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok || !Answerable(bytes, 0, &result)) return result;
  const ByteReader in(bytes.data(), bytes.size());
  switch (TagTypeOf(bytes)) {
    case kTypeDesc: {
      uint32_t count = 0;
      if (!in.U32(8, &count) || count > in.Remaining(12)) {
        RefuseTag("Description count exceeds the tag");
        return 0;
      }
      if (!buffer) return static_cast<int32_t>(count) + 1;
      // The count includes the text's terminating zero; a text stored without one
      // still ends at the count, with the zero in the place of its last byte.
      const uint32_t length = count > 0 ? count - 1 : 0;
      std::memcpy(buffer, in.At(12), length);
      buffer[length] = '\0';
      return static_cast<int32_t>(length);
    }
    case kTypeMluc: return ReadMluc(in, buffer, 0);
    default: RefuseTag(kUnexpectedType); return 0;
  }
}
