// File: KXGIdTable.h
//
// KXGIdTable numbers distinct strings (record ids such as "@I1@") in the
// order they are first seen: 0, 1, 2 ... Built for millions of short keys:
// the key bytes live in 1 MiB blocks (behind a varint length),
// and an open-addressing table of 8-byte slots finds them, so each key costs
// its length plus about 20 bytes. Nothing is ever moved or freed before
// the table is, so a returned view stays valid for the table's lifetime.
//
//   KXGIdTable table;
//   auto [index, added] = table.intern("@I1@");   // 0, true
//   table.text(index);                             // "@I1@"
//
// KXGChunkedVector is an append-only array in fixed blocks: growing it never
// copies what it holds, so its peak memory is its size, not twice that.
//
// Thread safety: one thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <utility>
#include <vector>

template <typename T, unsigned BlockBits = 14>
class KXGChunkedVector {
 public:
  static constexpr std::size_t kBlockSize = std::size_t{1} << BlockBits;

  void push_back(const T& value) {
    if (size_ % kBlockSize == 0) blocks_.push_back(std::make_unique<T[]>(kBlockSize));
    blocks_.back()[size_ % kBlockSize] = value;
    ++size_;
  }
  // `index` must be below size().
  [[nodiscard]] T& operator[](std::size_t index) noexcept {
    return blocks_[index >> BlockBits][index & (kBlockSize - 1)];
  }
  [[nodiscard]] const T& operator[](std::size_t index) const noexcept {
    return blocks_[index >> BlockBits][index & (kBlockSize - 1)];
  }
  [[nodiscard]] T& back() noexcept { return (*this)[size_ - 1]; }
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] bool empty() const noexcept { return size_ == 0; }

 private:
  std::vector<std::unique_ptr<T[]>> blocks_;
  std::size_t size_ = 0;
};

class KXGIdTable {
 public:
  KXGIdTable();

  // The key's number, and whether it was added by this call. Any bytes,
  // of any length, are a key (the empty string too). Throws
  // std::length_error past 4294967294 keys (numbers are 32-bit).
  std::pair<std::uint32_t, bool> intern(std::string_view key);
  // The key numbered `index` (must be below size()).
  [[nodiscard]] std::string_view text(std::uint32_t index) const noexcept;
  [[nodiscard]] std::size_t size() const noexcept { return positions_.size(); }

 private:
  struct Slot {
    std::uint32_t hash = 0;
    std::uint32_t index = 0;  // key number + 1; 0: empty
  };
  static constexpr unsigned kBlockBits = 20;

  std::uint64_t store(std::string_view key);
  void grow();

  std::vector<Slot> slots_;
  std::vector<std::unique_ptr<char[]>> blocks_;
  std::size_t blockUsed_ = std::size_t{1} << kBlockBits;  // forces a first block
  KXGChunkedVector<std::uint64_t> positions_;  // block << 20 | offset of each key
};
