// KXCSparseObjectArray<T>: objects at unsigned integer indexes with gaps,
// held strongly as std::shared_ptr<T>. A "safed" array locks itself around
// every operation and may be shared between threads; a plain one serves one
// thread at a time and takes no lock.
//
//   auto names = KXCSparseObjectArray<std::string>::newSafe();
//   names->setObject(std::make_shared<std::string>("Anna"), 1700);
//   if (auto name = (*names)[1700]) use(*name);
//   names->setObject(nullptr, 1700);                  // removes the entry
//
// Objects compare and hash as KXCHeldObject.h says: by value when T has ==,
// else by identity. Listing order (allIndexesAsNumbers, allObjects,
// enumeration) is the hash map's own and is not sorted.
//
// The lock is recursive, so a block given to enumerateIndexesAndObjects-
// UsingBlock may call back into the array. Enumeration walks a snapshot,
// so the block may also change the array; the changes do not show in the
// walk. Fast enumeration maps to a range-for over allObjects(), which is a
// snapshot too.
//
// Copies are deep in the map and shallow in the objects (both arrays hold
// the same objects) and keep `safed`. Equality compares contents only:
// a safed and a plain array with the same entries are equal.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <unordered_map>
#include <utility>
#include <vector>

#include "kxacore/Core/KXCDefer.h"
#include "kxacore/Core/KXCHeldObject.h"

template <typename T>
class KXCSparseObjectArray {
 public:
  using Object = std::shared_ptr<T>;
  using Map = std::unordered_map<std::uint64_t, Object>;

  // A new safed array, ready to be shared (a unique_ptr converts to shared_ptr).
  [[nodiscard]] static std::unique_ptr<KXCSparseObjectArray> newSafe() {
    return std::make_unique<KXCSparseObjectArray>(true);
  }

  KXCSparseObjectArray() : KXCSparseObjectArray(false) {}
  explicit KXCSparseObjectArray(bool safed) : safed_(safed) { mapTable_.reserve(kInitialCapacity); }

  KXCSparseObjectArray(const KXCSparseObjectArray& other) : safed_(other.safed_) {
    const auto guard = other.enter();
    mapTable_ = other.mapTable_;
  }
  // Takes the other's contents and `safed`. Locks both, this one first.
  KXCSparseObjectArray& operator=(const KXCSparseObjectArray& other) {
    if (this == &other) return *this;
    const auto locks = lockBoth(other);
    mapTable_ = other.mapTable_;
    safed_ = other.safed_;
    return *this;
  }
  ~KXCSparseObjectArray() = default;

  // Fixed at construction (or by assignment, which no other thread may race).
  [[nodiscard]] bool safed() const noexcept { return safed_; }
  // A copy of the map, taken under the lock.
  [[nodiscard]] Map mapTable() const {
    const auto guard = enter();
    return mapTable_;
  }

  [[nodiscard]] std::size_t count() const {
    const auto guard = enter();
    return mapTable_.size();
  }

  // The object at `index`, or null when none was set.
  [[nodiscard]] Object objectAtIndex(std::uint64_t index) const {
    const auto guard = enter();
    const auto found = mapTable_.find(index);
    return found == mapTable_.end() ? nullptr : found->second;
  }

  // Stores `object` at `index`, replacing what was there; null removes the entry.
  void setObject(Object object, std::uint64_t index) {
    const auto guard = enter();
    if (object) {
      mapTable_.insert_or_assign(index, std::move(object));
    } else {
      mapTable_.erase(index);
    }
  }

  void removeObjectAtIndex(std::uint64_t index) {
    const auto guard = enter();
    mapTable_.erase(index);
  }

  void removeAllObjects() {
    const auto guard = enter();
    mapTable_.clear();
  }

  [[nodiscard]] bool hasIndex(std::uint64_t index) const {
    const auto guard = enter();
    return mapTable_.contains(index);
  }

  // Whether some held object equals `object`; false for null.
  [[nodiscard]] bool hasObject(const Object& object) const {
    if (!object) return false;
    const auto guard = enter();
    for (const auto& [index, held] : mapTable_) {
      if (KXCHeldObject::equal(held, object)) return true;
    }
    return false;
  }

  // Whether this very object is held; false for null.
  [[nodiscard]] bool hasObjectIdenticalTo(const Object& object) const {
    if (!object) return false;
    const auto guard = enter();
    for (const auto& [index, held] : mapTable_) {
      if (held == object) return true;
    }
    return false;
  }

  [[nodiscard]] std::vector<std::uint64_t> allIndexesAsNumbers() const {
    const auto guard = enter();
    std::vector<std::uint64_t> indexes;
    indexes.reserve(mapTable_.size());
    for (const auto& [index, held] : mapTable_) indexes.push_back(index);
    return indexes;
  }

  [[nodiscard]] std::vector<Object> allObjects() const {
    const auto guard = enter();
    std::vector<Object> objects;
    objects.reserve(mapTable_.size());
    for (const auto& [index, held] : mapTable_) objects.push_back(held);
    return objects;
  }

  // Calls block(index, object, stop) for each entry of a snapshot, under
  // the lock when safed; setting `stop` ends the walk.
  template <typename F>
  void enumerateIndexesAndObjectsUsingBlock(F&& block) const {
    const auto guard = enter();
    const std::vector<std::pair<std::uint64_t, Object>> snapshot(mapTable_.begin(), mapTable_.end());
    bool stop = false;
    for (const auto& [index, object] : snapshot) {
      block(index, object, stop);
      if (stop) break;
    }
  }

  // Independent of enumeration order; equal arrays hash alike.
  [[nodiscard]] std::size_t hash() const {
    const auto guard = enter();
    std::size_t sum = 0;
    for (const auto& [index, held] : mapTable_) {
      sum += KXCHeldObject::entryHash(std::hash<std::uint64_t>{}(index), KXCHeldObject::hash(held));
    }
    return sum;
  }

  // The same array, or the same indexes holding equal objects. Takes both
  // locks (each only when safed), this one first; should the other be busy
  // it backs off and retries rather than deadlock against a thread that
  // compares the other way round.
  [[nodiscard]] bool isEqual(const KXCSparseObjectArray& other) const {
    if (this == &other) return true;
    const auto locks = lockBoth(other);
    if (mapTable_.size() != other.mapTable_.size()) return false;
    for (const auto& [index, held] : mapTable_) {
      const auto found = other.mapTable_.find(index);
      if (found == other.mapTable_.end() || !KXCHeldObject::equal(held, found->second)) return false;
    }
    return true;
  }
  friend bool operator==(const KXCSparseObjectArray& a, const KXCSparseObjectArray& b) { return a.isEqual(b); }

  // Subscripting: `array[i]` reads like objectAtIndex, `array[i] = object`
  // writes like setObject (null removes).
  class Slot {
   public:
    Slot& operator=(Object object) {
      array_.setObject(std::move(object), index_);
      return *this;
    }
    operator Object() const { return array_.objectAtIndex(index_); }

   private:
    friend class KXCSparseObjectArray;
    Slot(KXCSparseObjectArray& array, std::uint64_t index) : array_(array), index_(index) {}
    KXCSparseObjectArray& array_;
    std::uint64_t index_;
  };
  [[nodiscard]] Slot operator[](std::uint64_t index) { return Slot(*this, index); }
  [[nodiscard]] Object operator[](std::uint64_t index) const { return objectAtIndex(index); }

 private:
  static constexpr std::size_t kInitialCapacity = 1024;
  using Guard = std::unique_lock<std::recursive_mutex>;

  // Enters the lock when safed; the returned guard leaves it at the end of
  // the caller's scope, also when an exception (bad_alloc) unwinds it.
  [[nodiscard]] KXCDefer enter() const {
    if (!safed_) return KXCDefer(KXCDefer::Block{});
    lock_.lock();
    return KXCDefer([this] { lock_.unlock(); });
  }

  [[nodiscard]] std::pair<Guard, Guard> lockBoth(const KXCSparseObjectArray& other) const {
    Guard mine(lock_, std::defer_lock);
    Guard theirs(other.lock_, std::defer_lock);
    if (safed_ && other.safed_) {
      std::lock(mine, theirs);  // tries this one first
    } else if (safed_) {
      mine.lock();
    } else if (other.safed_) {
      theirs.lock();
    }
    return {std::move(mine), std::move(theirs)};
  }

  bool safed_;
  Map mapTable_;  // guarded by lock_ when safed_
  mutable std::recursive_mutex lock_;
};
