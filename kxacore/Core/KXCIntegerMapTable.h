// KXCIntegerMapTable: a map from integer keys to integer values, both kept
// as plain integers (no boxing), for callers that count or index by id.
//
//   KXCIntegerMapTable generations;
//   generations.setValue(3, personId);
//   if (generations.hasKey(personId)) use(generations.valueForKey(personId));
//
// A missing key reads as 0: use hasKey to tell "absent" from a stored 0.
// allKeysAsNumbers lists keys in the hash map's own order, unsorted.
// Not copyable: callers share one table by reference. Movable.
// One thread at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <unordered_map>
#include <vector>

class KXCIntegerMapTable {
 public:
  using Map = std::unordered_map<std::int64_t, std::int64_t>;

  KXCIntegerMapTable() { mapTable_.reserve(kInitialCapacity); }
  KXCIntegerMapTable(const KXCIntegerMapTable&) = delete;
  KXCIntegerMapTable& operator=(const KXCIntegerMapTable&) = delete;
  KXCIntegerMapTable(KXCIntegerMapTable&&) noexcept = default;
  KXCIntegerMapTable& operator=(KXCIntegerMapTable&&) noexcept = default;

  // Stores `value` under `key`, replacing an earlier value.
  void setValue(std::int64_t value, std::int64_t key) { mapTable_.insert_or_assign(key, value); }

  // The value under `key`, or 0 when there is none.
  [[nodiscard]] std::int64_t valueForKey(std::int64_t key) const {
    const auto found = mapTable_.find(key);
    return found == mapTable_.end() ? 0 : found->second;
  }

  [[nodiscard]] bool hasKey(std::int64_t key) const { return mapTable_.contains(key); }

  [[nodiscard]] std::vector<std::int64_t> allKeysAsNumbers() const {
    std::vector<std::int64_t> keys;
    keys.reserve(mapTable_.size());
    for (const auto& [key, value] : mapTable_) keys.push_back(key);
    return keys;
  }

  [[nodiscard]] const Map& mapTable() const noexcept { return mapTable_; }

 private:
  static constexpr std::size_t kInitialCapacity = 1000;
  Map mapTable_;
};
