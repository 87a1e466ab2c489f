#include "kxacore/Gedcom/KXGIdTable.h"

#include <algorithm>
#include <cstring>
#include <functional>
#include <stdexcept>

namespace {

constexpr std::size_t kMaxLengthBytes = 10;  // a 64-bit length as a varint

std::uint32_t hashOf(std::string_view key) noexcept {
  return static_cast<std::uint32_t>(std::hash<std::string_view>{}(key));
}

}  // namespace

KXGIdTable::KXGIdTable() : slots_(1024) {}

std::pair<std::uint32_t, bool> KXGIdTable::intern(std::string_view key) {
  const std::uint32_t hash = hashOf(key);
  const std::size_t mask = slots_.size() - 1;
  for (std::size_t at = hash & mask;; at = (at + 1) & mask) {
    const Slot slot = slots_[at];
    if (slot.index == 0) break;
    if (slot.hash == hash && text(slot.index - 1) == key) return {slot.index - 1, false};
  }
  // Slot numbers are index + 1 and 0 means empty, so the last number is never handed out.
  if (positions_.size() >= 0xFFFFFFFEu) throw std::length_error("too many ids");
  const auto index = static_cast<std::uint32_t>(positions_.size());
  positions_.push_back(store(key));
  if ((positions_.size() + 1) * 4 > slots_.size() * 3) grow();
  const std::size_t newMask = slots_.size() - 1;
  std::size_t at = hash & newMask;
  while (slots_[at].index != 0) at = (at + 1) & newMask;
  slots_[at] = {hash, index + 1};
  return {index, true};
}

std::string_view KXGIdTable::text(std::uint32_t index) const noexcept {
  const std::uint64_t position = positions_[index];
  const char* at = blocks_[position >> kBlockBits].get() + (position & ((1u << kBlockBits) - 1));
  std::size_t length = 0;
  for (unsigned shift = 0;; shift += 7) {
    const auto byte = static_cast<unsigned char>(*at++);
    length |= std::size_t{byte & 0x7Fu} << shift;
    if ((byte & 0x80u) == 0) break;
  }
  return {at, length};
}

std::uint64_t KXGIdTable::store(std::string_view key) {
  constexpr std::size_t kBlockSize = std::size_t{1} << kBlockBits;
  const std::size_t needed = key.size() + kMaxLengthBytes;
  if (blockUsed_ + needed > kBlockSize) {
    // A key longer than a block gets a block of its own; the next key starts a fresh one.
    blocks_.push_back(std::make_unique_for_overwrite<char[]>(std::max(needed, kBlockSize)));
    blockUsed_ = 0;
  }
  const std::uint64_t position = (std::uint64_t{blocks_.size() - 1} << kBlockBits) | blockUsed_;
  char* const start = blocks_.back().get() + blockUsed_;
  char* at = start;
  std::size_t length = key.size();
  do {
    *at++ = static_cast<char>((length & 0x7Fu) | (length > 0x7F ? 0x80u : 0u));
    length >>= 7;
  } while (length != 0);
  if (!key.empty()) std::memcpy(at, key.data(), key.size());
  blockUsed_ += static_cast<std::size_t>(at - start) + key.size();
  return position;
}

void KXGIdTable::grow() {
  std::vector<Slot> larger(slots_.size() * 2);
  const std::size_t mask = larger.size() - 1;
  for (const Slot& slot : slots_) {
    if (slot.index == 0) continue;
    std::size_t at = slot.hash & mask;
    while (larger[at].index != 0) at = (at + 1) & mask;
    larger[at] = slot;
  }
  slots_ = std::move(larger);
}
