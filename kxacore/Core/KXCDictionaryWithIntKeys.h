// KXCDictionaryWithIntKeys<T>: objects (std::shared_ptr<T>) under integer
// keys.
//
//   KXCDictionaryWithIntKeys<Person> people;
//   people.setObject(std::make_shared<Person>(...), 42);
//   const auto frozen = people.copy();   // read-only snapshot
//
// Null objects are never stored: setObject(nullptr, key) does nothing and
// leaves an existing entry in place (unlike KXCSparseObjectArray, where
// null removes).
//
// copy() returns a read-only dictionary: it is meant to be read, and its
// mutators refuse to work (setObject and removeObjectForIntegerKey return
// false and change nothing). There is no copy constructor, so a read-only
// copy is never made by accident. Copies share the objects.
//
// description() prints "{1: Anna, 7: Bert}": keys ascending so that the
// text is stable, values streamed with << when T supports it, else as their
// address "<0x...>"; an empty dictionary prints "{}".
// allValues lists values in the hash map's own order, unsorted.
// One thread at a time.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <sstream>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "kxacore/Core/KXCHeldObject.h"

template <typename T>
class KXCDictionaryWithIntKeys {
 public:
  using Object = std::shared_ptr<T>;
  using Map = std::unordered_map<std::int64_t, Object>;

  KXCDictionaryWithIntKeys() : KXCDictionaryWithIntKeys(0) {}
  explicit KXCDictionaryWithIntKeys(std::size_t capacity) { dictionary_.reserve(capacity); }
  KXCDictionaryWithIntKeys(const KXCDictionaryWithIntKeys&) = delete;
  KXCDictionaryWithIntKeys& operator=(const KXCDictionaryWithIntKeys&) = delete;
  KXCDictionaryWithIntKeys(KXCDictionaryWithIntKeys&&) noexcept = default;
  KXCDictionaryWithIntKeys& operator=(KXCDictionaryWithIntKeys&&) noexcept = default;

  // A read-only dictionary with the same entries (see the file comment).
  [[nodiscard]] KXCDictionaryWithIntKeys copy() const {
    KXCDictionaryWithIntKeys copied(dictionary_);
    copied.readOnly_ = true;
    return copied;
  }

  // True for a dictionary made by copy().
  [[nodiscard]] bool isReadOnly() const noexcept { return readOnly_; }

  // The object under `key`, or null.
  [[nodiscard]] Object objectForIntegerKey(std::int64_t key) const {
    const auto found = dictionary_.find(key);
    return found == dictionary_.end() ? nullptr : found->second;
  }

  // Stores `object` under `key`, replacing an earlier one. Returns false,
  // changing nothing, for a null object or a read-only dictionary.
  bool setObject(Object object, std::int64_t key) {
    if (!object || readOnly_) return false;
    dictionary_.insert_or_assign(key, std::move(object));
    return true;
  }

  // Returns whether an entry was removed: false when there was none or the
  // dictionary is read-only.
  bool removeObjectForIntegerKey(std::int64_t key) {
    if (readOnly_) return false;
    return dictionary_.erase(key) > 0;
  }

  [[nodiscard]] std::vector<Object> allValues() const {
    std::vector<Object> values;
    values.reserve(dictionary_.size());
    for (const auto& [key, object] : dictionary_) values.push_back(object);
    return values;
  }

  [[nodiscard]] std::size_t count() const noexcept { return dictionary_.size(); }

  [[nodiscard]] std::string description() const {
    std::vector<std::pair<std::int64_t, const Object*>> sorted;
    sorted.reserve(dictionary_.size());
    for (const auto& [key, object] : dictionary_) sorted.emplace_back(key, &object);
    std::sort(sorted.begin(), sorted.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
    std::ostringstream out;
    out << '{';
    for (std::size_t i = 0; i < sorted.size(); ++i) {
      if (i > 0) out << ", ";
      out << sorted[i].first << ": ";
      KXCHeldObject::describe(out, *sorted[i].second);
    }
    out << '}';
    return out.str();
  }

  [[nodiscard]] const Map& dictionary() const noexcept { return dictionary_; }

 private:
  explicit KXCDictionaryWithIntKeys(Map entries) : dictionary_(std::move(entries)) {}

  Map dictionary_;
  bool readOnly_ = false;
};
