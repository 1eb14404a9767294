// What every tag codec shares: the banner and piece-by-piece write of a tag, and the
// read of a whole element into memory, decoded from there with bounded big-endian reads.
#ifndef TINTWELL_TAGS_TAG_IO_H
#define TINTWELL_TAGS_TAG_IO_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "win32_api.h"

// ---- Writing ----

// The banner every writer traces first: "-------->" three times, writerLine
// ("--------> HALVO_ICMWriteTagCurve"), the tag's four characters, "-------->".
void TraceWriteBanner(const char* writerLine, TAGTYPE tag);

// Writes one tag piece by piece. The constructor empties the element and sizes it to
// total bytes (results ignored, as a failed sizing shows in the first piece). Each Put
// writes the next piece at the offset behind the previous one. The first piece that
// fails is traced with its message and reported with SetCMError(GetLastError()); every
// later Put then writes nothing and fails at once, so a tag is never written past a
// failure and the caller's LastCMError tells the outcome.
class TagWriter {
 public:
  TagWriter(HPROFILE profile, TAGTYPE tag, DWORD total);
  bool Put(const void* bytes, DWORD size, const char* failMessage);
  bool PutU16(uint16_t value, const char* failMessage);  // big-endian
  bool PutU32(uint32_t value, const char* failMessage);  // big-endian
  // The 8-byte type header: the type signature big-endian, then four zero bytes.
  bool PutTypeHeader(uint32_t typeSignature, const char* failMessage);
  bool failed() const { return failed_; }
  DWORD offset() const { return offset_; }

 private:
  HPROFILE profile_;
  TAGTYPE tag_;
  DWORD offset_ = 0;
  bool failed_ = false;
};

// ---- Reading ----

// Big-endian reads over bytes held in memory; every read checks the bytes that remain.
class ByteReader {
 public:
  ByteReader(const uint8_t* data, std::size_t size) : data_(data), size_(size) {}
  std::size_t size() const { return size_; }
  // The bytes left from offset on; 0 past the end.
  std::size_t Remaining(std::size_t offset) const { return offset < size_ ? size_ - offset : 0; }
  bool Has(std::size_t offset, std::size_t count) const { return count <= Remaining(offset); }
  // False (and out untouched) when the bytes are not all there.
  bool U8(std::size_t offset, uint8_t* out) const;
  bool U16(std::size_t offset, uint16_t* out) const;
  bool U32(std::size_t offset, uint32_t* out) const;
  bool S15Fixed16(std::size_t offset, double* out) const;
  const uint8_t* At(std::size_t offset) const { return data_ + offset; }  // caller checked Has

 private:
  const uint8_t* data_;
  std::size_t size_;
};

// The failure value a reader returns, and whether the prologue found the tag.
enum class TagRead { Ok, Failed };

// The common read prologue, then the whole element fetched into bytes:
// 1. IsColorProfileTagPresent fails: trace "IsColorProfileTagPresent error",
//    SetCMError(GetLastError()), Failed.
// 2. Absent: trace "Tag is not present", Failed, LastCMError untouched.
// 3. The element's size (judged by the size a query reports) and its bytes; a size
//    below 1 or a failed fetch: trace "Data size is < 1", SetCMError(GetLastError()),
//    Failed. An element shorter than 8 bytes has no type: RefuseTag (below), Failed.
TagRead ReadWholeTag(HPROFILE profile, TAGTYPE tag, std::vector<uint8_t>& bytes);

// The type signature of an element read by ReadWholeTag (its first four bytes).
uint32_t TagTypeOf(const std::vector<uint8_t>& bytes);

// Refuses a tag whose content does not hold what it claims (a count beyond its bytes,
// an unexpected type): traces message and reports ERROR_INVALID_PROFILE (2011).
void RefuseTag(const char* message);

// Big-endian helpers for building pieces.
void StoreU16(uint8_t* at, uint16_t value);
void StoreU32(uint8_t* at, uint32_t value);
// trunc(value x 65536) as a signed 32-bit word, big-endian (the s15Fixed16Number).
void StoreS15Fixed16(uint8_t* at, double value);

// Type signatures.
constexpr uint32_t kTypeCurve = 0x63757276;       // 'curv'
constexpr uint32_t kTypeParametric = 0x70617261;  // 'para'
constexpr uint32_t kTypeXYZ = 0x58595A20;         // 'XYZ '
constexpr uint32_t kTypeText = 0x74657874;        // 'text'
constexpr uint32_t kTypeDesc = 0x64657363;        // 'desc'
constexpr uint32_t kTypeMluc = 0x6D6C7563;        // 'mluc'
constexpr uint32_t kTypeNamedColor2 = 0x6E636C32;  // 'ncl2'

#endif
