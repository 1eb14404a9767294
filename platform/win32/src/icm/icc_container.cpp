#include "icm/icc_container.h"

#include <cstring>
#include <limits>
#include <new>
#include <unordered_set>

namespace win32::icm {

namespace {


std::uint64_t AlignUp4(std::uint64_t n) { return (n + 3) & ~std::uint64_t{3}; }

}  // namespace

std::uint32_t ReadBE32(const std::uint8_t* p) {
  return (std::uint32_t{p[0]} << 24) | (std::uint32_t{p[1]} << 16) | (std::uint32_t{p[2]} << 8) |
         std::uint32_t{p[3]};
}

void WriteBE32(std::uint8_t* p, std::uint32_t value) {
  p[0] = static_cast<std::uint8_t>(value >> 24);
  p[1] = static_cast<std::uint8_t>(value >> 16);
  p[2] = static_cast<std::uint8_t>(value >> 8);
  p[3] = static_cast<std::uint8_t>(value);
}

bool MemorySource::ReadAt(std::uint64_t offset, std::size_t size, std::uint8_t* out) const {
  if (offset > bytes_->size() || size > bytes_->size() - offset) return false;
  if (size != 0) std::memcpy(out, bytes_->data() + offset, size);
  return true;
}

Block::Block(std::shared_ptr<const ByteSource> source, std::uint64_t offset, std::size_t size)
    : source_(std::move(source)), view_(nullptr), size_(size), offset_(offset) {
  if (const std::uint8_t* memory = source_->Memory()) {
    view_ = memory + offset;
  } else {
    state_ = State::Pending;
  }
}

bool Block::Load() const {
  if (state_ == State::Pending) {
    // The element's own bytes, read in one go; a short read means the file changed
    // under the open profile, and no bytes are made up in its place.
    own_.resize(size_);
    if (source_->ReadAt(offset_, size_, own_.data())) {
      state_ = State::Ready;
      view_ = own_.data();
    } else {
      state_ = State::Unreadable;
      Bytes().swap(own_);
    }
    source_.reset();
  }
  return state_ == State::Ready;
}

std::uint8_t* Block::MutableData() {
  if (source_) {
    own_.assign(view_, view_ + size_);
    source_.reset();
    view_ = own_.data();
  }
  return own_.data();
}

void Block::Resize(std::size_t size) {
  MutableData();
  own_.resize(size, 0);
  view_ = own_.data();
  size_ = size;
}

DWORD IccContainer::Parse(std::shared_ptr<const Bytes> bytes, IccContainer& out) {
  const std::uint64_t size = bytes->size();
  return Parse(std::make_shared<MemorySource>(std::move(bytes)), size, out);
}

DWORD IccContainer::Parse(std::shared_ptr<const ByteSource> source, std::uint64_t size, IccContainer& out) {
  if (size < kMinProfileSize || size > kMaxProfileSize) return ERROR_INVALID_PROFILE;
  std::uint8_t head[kMinProfileSize];
  if (!source->ReadAt(0, kMinProfileSize, head)) return ERROR_INVALID_PROFILE;
  if (ReadBE32(head + kOffsetSignature) != kSignatureAcsp) return ERROR_INVALID_PROFILE;

  // Bytes after a smaller declared size are not part of the profile; a larger declared
  // size (a truncated file) is left for the validity check to report.
  std::uint64_t extent = size;
  const std::uint32_t declared = ReadBE32(head + kOffsetSize);
  if (declared >= kMinProfileSize && declared < extent) extent = declared;

  // The count is checked against the bytes that could hold its entries before it sizes
  // anything.
  const std::uint64_t count = ReadBE32(head + kHeaderSize);
  if (count > (extent - kMinProfileSize) / kTagEntrySize) return ERROR_INVALID_PROFILE;
  const std::size_t tableSize = static_cast<std::size_t>(count * kTagEntrySize);
  const std::uint8_t* table;
  Bytes tableCopy;
  if (const std::uint8_t* memory = source->Memory()) {
    table = memory + kMinProfileSize;
  } else {
    tableCopy.resize(tableSize);
    if (!source->ReadAt(kMinProfileSize, tableSize, tableCopy.data())) return ERROR_INVALID_PROFILE;
    table = tableCopy.data();
  }

  // Check the whole table before using any of it.
  std::unordered_set<std::uint32_t> seen;
  seen.reserve(static_cast<std::size_t>(count));
  for (std::uint64_t i = 0; i < count; ++i) {
    const std::uint8_t* entry = table + i * kTagEntrySize;
    const std::uint64_t offset = ReadBE32(entry + 4);
    const std::uint64_t length = ReadBE32(entry + 8);
    if (offset > extent || length > extent - offset) return ERROR_INVALID_PROFILE;
    // Two entries for one tag leave no way to tell which one a caller means.
    if (!seen.insert(ReadBE32(entry)).second) return ERROR_INVALID_PROFILE;
  }

  IccContainer result;
  std::memcpy(result.header_.data(), head, kHeaderSize);
  result.byte_size_ = extent;
  result.tags_.reserve(static_cast<std::size_t>(count));
  std::unordered_map<std::uint64_t, std::shared_ptr<Block>> blocks;  // (offset, size) -> data
  for (std::uint64_t i = 0; i < count; ++i) {
    const std::uint8_t* entry = table + i * kTagEntrySize;
    const std::uint32_t offset = ReadBE32(entry + 4);
    const std::uint32_t length = ReadBE32(entry + 8);
    std::shared_ptr<Block>& block = blocks[(std::uint64_t{offset} << 32) | length];
    if (!block) block = std::make_shared<Block>(source, offset, length);
    result.tags_.push_back(Tag{ReadBE32(entry), block});
  }
  result.RebuildIndex();
  out = std::move(result);
  return ERROR_SUCCESS;
}

IccContainer IccContainer::Blank() {
  IccContainer blank;
  WriteBE32(blank.header_.data() + kOffsetSize, static_cast<std::uint32_t>(kMinProfileSize));
  WriteBE32(blank.header_.data() + kOffsetVersion, 0x02100000);
  WriteBE32(blank.header_.data() + kOffsetSignature, kSignatureAcsp);
  WriteBE32(blank.header_.data() + kOffsetIlluminant, 0x0000F6D6);
  WriteBE32(blank.header_.data() + kOffsetIlluminant + 4, 0x00010000);
  WriteBE32(blank.header_.data() + kOffsetIlluminant + 8, 0x0000D32D);
  return blank;
}

void IccContainer::SetHeader(const std::uint8_t* bytes) {
  std::memcpy(header_.data(), bytes, kHeaderSize);
}

const Block* IccContainer::Element(std::uint32_t signature) const {
  auto it = index_.find(signature);
  return it == index_.end() ? nullptr : tags_[it->second].data.get();
}

bool IccContainer::IsShared(std::uint32_t signature) const {
  auto it = index_.find(signature);
  return it != index_.end() && tags_[it->second].data.use_count() > 1;
}

// Callers have loaded the block.
Block& IccContainer::OwnBlock(std::size_t index) {
  std::shared_ptr<Block>& data = tags_[index].data;
  if (data.use_count() > 1) data = std::make_shared<Block>(data->data(), data->size());
  return *data;
}

std::size_t IccContainer::WriteElement(std::uint32_t signature, std::size_t offset, const void* data,
                                       std::size_t count) {
  auto it = index_.find(signature);
  if (it == index_.end()) return 0;
  const Block& current = *tags_[it->second].data;
  if (offset >= current.size() || count == 0 || !current.Load()) return 0;
  const std::size_t n = count < current.size() - offset ? count : current.size() - offset;
  std::memcpy(OwnBlock(it->second).MutableData() + offset, data, n);
  return n;
}

DWORD IccContainer::ResizeElement(std::uint32_t signature, std::size_t size) {
  auto it = index_.find(signature);
  if (size == 0) {
    if (it == index_.end()) return ERROR_TAG_NOT_FOUND;
    tags_.erase(tags_.begin() + static_cast<std::ptrdiff_t>(it->second));
    RebuildIndex();
  } else {
    // The file must stay addressable with 32-bit offsets and sizes.
    // A shared block stays in the file for its other entries, so only an own block's
    // bytes are given back.
    const bool exists = it != index_.end();
    const bool own = exists && tags_[it->second].data.use_count() == 1;
    const std::uint64_t freed = own ? AlignUp4(tags_[it->second].data->size()) : 0;
    const std::uint64_t added = (exists ? 0 : kTagEntrySize) + AlignUp4(size);
    if (size > kMaxProfileSize || SerializedSize() + added - freed > kMaxProfileSize) return ERROR_NOT_ENOUGH_MEMORY;
    if (it == index_.end()) {
      tags_.push_back(Tag{signature, std::make_shared<Block>(size)});
      index_[signature] = tags_.size() - 1;
    } else {
      if (!tags_[it->second].data->Load()) return ERROR_INVALID_PROFILE;
      OwnBlock(it->second).Resize(size);
    }
  }
  byte_size_ = SerializedSize();
  WriteBE32(header_.data() + kOffsetSize, static_cast<std::uint32_t>(byte_size_));
  return ERROR_SUCCESS;
}

DWORD IccContainer::AddReference(std::uint32_t newTag, std::uint32_t refTag) {
  if (index_.count(newTag) != 0) return ERROR_DUPLICATE_TAG;
  auto ref = index_.find(refTag);
  if (ref == index_.end()) return ERROR_TAG_NOT_FOUND;
  // Only a table entry is added; the data is written once however many entries share it.
  if (SerializedSize() + kTagEntrySize > kMaxProfileSize) return ERROR_NOT_ENOUGH_MEMORY;
  tags_.push_back(Tag{newTag, tags_[ref->second].data});
  index_[newTag] = tags_.size() - 1;
  byte_size_ = SerializedSize();
  WriteBE32(header_.data() + kOffsetSize, static_cast<std::uint32_t>(byte_size_));
  return ERROR_SUCCESS;
}

void IccContainer::RebuildIndex() {
  index_.clear();
  index_.reserve(tags_.size());
  for (std::size_t i = 0; i < tags_.size(); ++i) index_.emplace(tags_[i].signature, i);
}

std::uint64_t IccContainer::SerializedSize() const {
  std::uint64_t total = kMinProfileSize + tags_.size() * kTagEntrySize;
  std::unordered_set<const Block*> placed;
  for (const Tag& tag : tags_)
    if (placed.insert(tag.data.get()).second) total = AlignUp4(total) + tag.data->size();
  return AlignUp4(total);
}

DWORD IccContainer::Serialize(Bytes& result) const {
  const std::uint64_t total = SerializedSize();
  if (total > kMaxProfileSize) throw std::bad_alloc();
  for (const Tag& tag : tags_)
    if (!tag.data->Load()) return ERROR_INVALID_PROFILE;
  Bytes out(header_.begin(), header_.end());
  out.resize(static_cast<std::size_t>(total), 0);
  WriteBE32(out.data() + kOffsetSize, static_cast<std::uint32_t>(total));
  WriteBE32(out.data() + kHeaderSize, static_cast<std::uint32_t>(tags_.size()));

  std::unordered_map<const Block*, std::uint32_t> offsets;
  std::uint64_t next = kMinProfileSize + tags_.size() * kTagEntrySize;
  std::uint8_t* entry = out.data() + kMinProfileSize;
  for (const Tag& tag : tags_) {
    auto placed = offsets.emplace(tag.data.get(), 0);
    if (placed.second) {
      next = AlignUp4(next);
      placed.first->second = static_cast<std::uint32_t>(next);
      if (tag.data->size() != 0) std::memcpy(out.data() + next, tag.data->data(), tag.data->size());
      next += tag.data->size();
    }
    WriteBE32(entry, tag.signature);
    WriteBE32(entry + 4, placed.first->second);
    WriteBE32(entry + 8, static_cast<std::uint32_t>(tag.data->size()));
    entry += kTagEntrySize;
  }
  result = std::move(out);
  return ERROR_SUCCESS;
}

}  // namespace win32::icm
