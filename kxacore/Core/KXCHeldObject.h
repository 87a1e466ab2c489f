// Equality, hashing and printing of objects that the Core containers hold
// as std::shared_ptr<T>, the way a C++ user of T expects:
//
// - equal: both null, or both set and *a == *b when T has ==; without ==,
//   the same object (identity).
// - hash: std::hash<T> of *p when T has both == and std::hash; identity
//   (the address) when T has neither; 0 when T has == but no std::hash, so
//   that equal objects at different addresses still hash alike. Null is 0.
// - describe: `out << *p` when T can be streamed, else "<0x...>" (the
//   address); null prints "(null)".
#pragma once

#include <concepts>
#include <cstddef>
#include <functional>
#include <memory>
#include <ostream>

namespace KXCHeldObject {

template <typename T>
concept Hashable = requires(const T& value) {
  { std::hash<T>{}(value) } -> std::convertible_to<std::size_t>;
};

template <typename T>
concept Streamable = requires(std::ostream& out, const T& value) { out << value; };

template <typename T>
[[nodiscard]] bool equal(const std::shared_ptr<T>& a, const std::shared_ptr<T>& b) {
  if (a == b) return true;
  if (!a || !b) return false;
  if constexpr (std::equality_comparable<T>) {
    return *a == *b;
  } else {
    return false;
  }
}

template <typename T>
[[nodiscard]] std::size_t hash(const std::shared_ptr<T>& object) {
  if (!object) return 0;
  if constexpr (std::equality_comparable<T>) {
    if constexpr (Hashable<T>) {
      return std::hash<T>{}(*object);
    } else {
      return 0;
    }
  } else {
    return std::hash<const T*>{}(object.get());
  }
}

template <typename T>
void describe(std::ostream& out, const std::shared_ptr<T>& object) {
  if (!object) {
    out << "(null)";
  } else if constexpr (Streamable<T>) {
    out << *object;
  } else {
    out << '<' << static_cast<const void*>(object.get()) << '>';
  }
}

// Mixes one entry's key and value hashes so that summing entries gives an
// order-free hash of a whole map (unordered maps of equal content may
// enumerate in different orders).
[[nodiscard]] inline std::size_t entryHash(std::size_t keyHash, std::size_t valueHash) {
  std::size_t mixed = keyHash * 0x9E3779B97F4A7C15ULL ^ (valueHash + 0x632BE59BD9B4E019ULL);
  mixed ^= mixed >> 29;
  mixed *= 0xBF58476D1CE4E5B9ULL;
  return mixed ^ (mixed >> 32);
}

}  // namespace KXCHeldObject
