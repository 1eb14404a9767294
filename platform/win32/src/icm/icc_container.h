// An ICC profile held in memory: the 128-byte header, the tag table in file order and
// the tag data. Entries that shared one data block in the file keep sharing it until
// one of them is resized or rewritten. Reads and writes work on the stored bytes in
// place; the file layout is rebuilt only when the profile is serialised.
#ifndef TINTWELL_WIN32_ICM_ICC_CONTAINER_H
#define TINTWELL_WIN32_ICM_ICC_CONTAINER_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <unordered_map>
#include <vector>

#include "windows.h"

namespace win32::icm {

constexpr std::size_t kHeaderSize = 128;
constexpr std::size_t kTagEntrySize = 12;
constexpr std::size_t kMinProfileSize = kHeaderSize + 4;  // header and tag count
constexpr std::uint64_t kMaxProfileSize = 0xFFFFFFFFu;     // sizes and offsets are 32-bit
constexpr std::uint32_t kSignatureAcsp = 0x61637370;       // 'acsp'
constexpr std::size_t kOffsetSize = 0;
constexpr std::size_t kOffsetVersion = 8;
constexpr std::size_t kOffsetClass = 12;
constexpr std::size_t kOffsetDataSpace = 16;
constexpr std::size_t kOffsetSignature = 36;
constexpr std::size_t kOffsetIlluminant = 68;

std::uint32_t ReadBE32(const std::uint8_t* p);
void WriteBE32(std::uint8_t* p, std::uint32_t value);

using Bytes = std::vector<std::uint8_t>;

// Where a parsed profile's bytes come from: a buffer in memory, or a file whose tag data
// is read when first used.
class ByteSource {
 public:
  virtual ~ByteSource() = default;
  // The whole source when it lies in memory, else null.
  virtual const std::uint8_t* Memory() const = 0;
  // Copies size bytes at offset into out; false when they cannot all be read (the file
  // shrank or failed since it was opened).
  virtual bool ReadAt(std::uint64_t offset, std::size_t size, std::uint8_t* out) const = 0;
};

class MemorySource : public ByteSource {
 public:
  explicit MemorySource(std::shared_ptr<const Bytes> bytes) : bytes_(std::move(bytes)) {}
  const std::uint8_t* Memory() const override { return bytes_->data(); }
  bool ReadAt(std::uint64_t offset, std::size_t size, std::uint8_t* out) const override;

 private:
  std::shared_ptr<const Bytes> bytes_;
};

// One element's data: a view into the bytes the profile was parsed from until it is
// first changed, its own copy from then on. An element of a file profile is read from
// the file on first use; until Load succeeds its bytes must not be touched.
class Block {
 public:
  Block(std::shared_ptr<const ByteSource> source, std::uint64_t offset, std::size_t size);
  explicit Block(std::size_t size) : own_(size), view_(own_.data()), size_(size) {}
  Block(const std::uint8_t* data, std::size_t size)
      : own_(data, data + size), view_(own_.data()), size_(size) {}
  Block(const Block&) = delete;
  Block& operator=(const Block&) = delete;

  // Makes the bytes available: true at once for bytes in memory; for a file, reads them
  // on the first call (a failure is final: the data is unreadable from then on).
  bool Load() const;
  // The bytes, valid after a successful Load.
  const std::uint8_t* data() const { return view_; }
  std::size_t size() const { return size_; }
  // Writable bytes; the first call copies a view. Needs a successful Load.
  std::uint8_t* MutableData();
  // Truncates or zero-extends. Needs a successful Load.
  void Resize(std::size_t size);

 private:
  enum class State : std::uint8_t { Ready, Pending, Unreadable };
  mutable std::shared_ptr<const ByteSource> source_;
  mutable Bytes own_;
  mutable const std::uint8_t* view_;
  std::size_t size_;
  std::uint64_t offset_ = 0;
  mutable State state_ = State::Ready;
};

class IccContainer {
 public:
  // Parses a profile, keeping the bytes as the elements' backing store. Returns
  // ERROR_SUCCESS, or ERROR_INVALID_PROFILE when the bytes are not a well-formed ICC
  // container (the whole tag table is checked before it is used). May throw
  // std::bad_alloc.
  static DWORD Parse(std::shared_ptr<const Bytes> bytes, IccContainer& out);
  // The same over a source of size bytes, reading only the header and the tag table
  // now; tag data is read when first used. A source that fails while the header or the
  // table is read gives ERROR_INVALID_PROFILE.
  static DWORD Parse(std::shared_ptr<const ByteSource> source, std::uint64_t size, IccContainer& out);

  // A profile with a header ('acsp', version 2.1, D50 illuminant) and no tags.
  static IccContainer Blank();

  const std::array<std::uint8_t, kHeaderSize>& Header() const { return header_; }
  // Stores the 128 header bytes as given.
  void SetHeader(const std::uint8_t* bytes);

  // Byte count of the profile as it stands: the parsed extent until the layout
  // changes, the serialised size afterwards.
  std::uint64_t ByteSize() const { return byte_size_; }

  std::size_t TagCount() const { return tags_.size(); }
  std::uint32_t TagAt(std::size_t index) const { return tags_[index].signature; }
  bool HasTag(std::uint32_t signature) const { return index_.count(signature) != 0; }

  // The element, or null when the tag is absent. Its bytes need a successful Load.
  const Block* Element(std::uint32_t signature) const;
  // True when another entry shares the element's data.
  bool IsShared(std::uint32_t signature) const;

  // Copies bytes into an existing element at offset, never past its end. The caller
  // has checked offset <= size and loaded the element. Returns the number of bytes written.
  std::size_t WriteElement(std::uint32_t signature, std::size_t offset, const void* data,
                           std::size_t count);

  // Creates (zero-filled), resizes (truncate or zero-extend) or, with size 0, removes
  // an element. A shared element first gets its own copy. Returns ERROR_SUCCESS,
  // ERROR_TAG_NOT_FOUND (removing an absent tag), ERROR_NOT_ENOUGH_MEMORY (the file
  // would outgrow 32-bit sizes) or ERROR_INVALID_PROFILE (resizing an element whose data
  // cannot be read). The size field follows the new layout.
  DWORD ResizeElement(std::uint32_t signature, std::size_t size);

  // Adds an entry for newTag at the end of the table that shares the data of refTag.
  // Returns ERROR_SUCCESS, ERROR_DUPLICATE_TAG (newTag exists), ERROR_TAG_NOT_FOUND
  // (refTag is absent) or ERROR_NOT_ENOUGH_MEMORY (the file would outgrow 32-bit sizes).
  DWORD AddReference(std::uint32_t newTag, std::uint32_t refTag);

  // The complete file: tag table in order, each distinct data block once, 4-byte
  // aligned with zero padding, size field set to the total. Returns ERROR_SUCCESS, or
  // ERROR_INVALID_PROFILE when some element's data cannot be read (nothing is made
  // from a profile that has lost bytes). May throw std::bad_alloc.
  DWORD Serialize(Bytes& out) const;

 private:
  struct Tag {
    std::uint32_t signature;
    std::shared_ptr<Block> data;  // only tag entries hold these pointers
  };

  Block& OwnBlock(std::size_t index);
  void RebuildIndex();
  std::uint64_t SerializedSize() const;

  std::array<std::uint8_t, kHeaderSize> header_{};
  std::vector<Tag> tags_;
  std::unordered_map<std::uint32_t, std::size_t> index_;
  std::uint64_t byte_size_ = kMinProfileSize;
};

}  // namespace win32::icm

#endif
