#include "tag_io.h"

#include <cmath>
#include <new>

#include "debugger.h"
#include "error_state.h"

namespace {

// Traces message, then reports code. Callers take the code before the trace, as a
// debugger's handler may call back into the plugin and change the thread's last error.
void Fail(const char* message, DWORD code) {
  SendDebugString(message);
  SetCMError(static_cast<int32_t>(code));
}

}  // namespace

// ---- Writing ----

void TraceWriteBanner(const char* writerLine, TAGTYPE tag) {
  SendDebugString("-------->");
  SendDebugString("-------->");
  SendDebugString("-------->");
  SendDebugString(writerLine);
  // The tag's four characters, most significant first, as TagToString gives them; built
  // here so that a trace needs no host string.
  const char text[5] = {static_cast<char>(tag >> 24), static_cast<char>(tag >> 16), static_cast<char>(tag >> 8),
                        static_cast<char>(tag), '\0'};
  SendDebugString(text);
  SendDebugString("-------->");
}

TagWriter::TagWriter(HPROFILE profile, TAGTYPE tag, DWORD total) : profile_(profile), tag_(tag) {
  SetColorProfileElementSize(profile, tag, 0);
  SetColorProfileElementSize(profile, tag, total);
}

bool TagWriter::Put(const void* bytes, DWORD size, const char* failMessage) {
  if (failed_) return false;
  DWORD written = size;
  DWORD code = ERROR_INVALID_PARAMETER;  // a piece that would end past the element
  bool ok = size <= 0xFFFFFFFFu - offset_;
  if (ok && !SetColorProfileElement(profile_, tag_, offset_, &written, const_cast<void*>(bytes))) {
    ok = false;
    // A failed call leaves a code; should one not, the failure must still show.
    if (GetLastError() != ERROR_SUCCESS) code = GetLastError();
  }
  // A short write means the element ends before the piece: its sizing did not take.
  if (!ok || written != size) {
    failed_ = true;
    Fail(failMessage, code);
    return false;
  }
  offset_ += size;
  return true;
}

bool TagWriter::PutU16(uint16_t value, const char* failMessage) {
  uint8_t bytes[2];
  StoreU16(bytes, value);
  return Put(bytes, sizeof bytes, failMessage);
}

bool TagWriter::PutU32(uint32_t value, const char* failMessage) {
  uint8_t bytes[4];
  StoreU32(bytes, value);
  return Put(bytes, sizeof bytes, failMessage);
}

bool TagWriter::PutTypeHeader(uint32_t typeSignature, const char* failMessage) {
  uint8_t bytes[8] = {};
  StoreU32(bytes, typeSignature);
  return Put(bytes, sizeof bytes, failMessage);
}

// ---- Reading ----

bool ByteReader::U8(std::size_t offset, uint8_t* out) const {
  if (!Has(offset, 1)) return false;
  *out = data_[offset];
  return true;
}

bool ByteReader::U16(std::size_t offset, uint16_t* out) const {
  if (!Has(offset, 2)) return false;
  *out = static_cast<uint16_t>(data_[offset] << 8 | data_[offset + 1]);
  return true;
}

bool ByteReader::U32(std::size_t offset, uint32_t* out) const {
  if (!Has(offset, 4)) return false;
  *out = static_cast<uint32_t>(data_[offset]) << 24 | static_cast<uint32_t>(data_[offset + 1]) << 16 |
         static_cast<uint32_t>(data_[offset + 2]) << 8 | static_cast<uint32_t>(data_[offset + 3]);
  return true;
}

bool ByteReader::S15Fixed16(std::size_t offset, double* out) const {
  uint32_t word;
  if (!U32(offset, &word)) return false;
  // Two's complement read without relying on the conversion of large unsigned values.
  const double whole = word < 0x80000000u ? static_cast<double>(word) : static_cast<double>(word) - 4294967296.0;
  *out = whole / 65536.0;
  return true;
}

TagRead ReadWholeTag(HPROFILE profile, TAGTYPE tag, std::vector<uint8_t>& bytes) {
  BOOL present = FALSE;
  if (!IsColorProfileTagPresent(profile, tag, &present)) {
    Fail("IsColorProfileTagPresent error", GetLastError());
    return TagRead::Failed;
  }
  if (!present) {
    SendDebugString("Tag is not present");
    return TagRead::Failed;
  }
  // The size query answers FALSE with ERROR_INSUFFICIENT_BUFFER even when it worked:
  // only the size it reports tells.
  DWORD size = 0;
  BOOL reference = FALSE;
  GetColorProfileElement(profile, tag, 0, &size, nullptr, &reference);
  if (size < 1) {
    Fail("Data size is < 1", GetLastError());
    return TagRead::Failed;
  }
  try {
    bytes.assign(size, 0);
  } catch (const std::bad_alloc&) {
    bytes.clear();
    Fail("Data size is < 1", ERROR_NOT_ENOUGH_MEMORY);
    return TagRead::Failed;
  }
  DWORD fetched = size;
  if (!GetColorProfileElement(profile, tag, 0, &fetched, bytes.data(), &reference) || fetched < 1) {
    const DWORD code = GetLastError();
    bytes.clear();
    Fail("Data size is < 1", code);
    return TagRead::Failed;
  }
  bytes.resize(fetched);  // never more than asked for; fewer only if the element shrank
  if (bytes.size() < 8) {
    RefuseTag("Tag is too short to hold its type");
    return TagRead::Failed;
  }
  return TagRead::Ok;
}

uint32_t TagTypeOf(const std::vector<uint8_t>& bytes) {
  uint32_t type = 0;
  ByteReader(bytes.data(), bytes.size()).U32(0, &type);
  return type;
}

void RefuseTag(const char* message) { Fail(message, ERROR_INVALID_PROFILE); }

void StoreU16(uint8_t* at, uint16_t value) {
  at[0] = static_cast<uint8_t>(value >> 8);
  at[1] = static_cast<uint8_t>(value);
}

void StoreU32(uint8_t* at, uint32_t value) {
  at[0] = static_cast<uint8_t>(value >> 24);
  at[1] = static_cast<uint8_t>(value >> 16);
  at[2] = static_cast<uint8_t>(value >> 8);
  at[3] = static_cast<uint8_t>(value);
}

void StoreS15Fixed16(uint8_t* at, double value) {
  // Converting a double outside int32's range (or NaN) is undefined: such values
  // saturate at the nearest end of the range instead, and NaN is stored as 0.
  const double scaled = std::trunc(value * 65536.0);
  int32_t word;
  if (std::isnan(scaled)) {
    word = 0;
  } else if (scaled >= 2147483647.0) {
    word = INT32_MAX;
  } else if (scaled <= -2147483648.0) {
    word = INT32_MIN;
  } else {
    word = static_cast<int32_t>(scaled);
  }
  StoreU32(at, static_cast<uint32_t>(word));
}
