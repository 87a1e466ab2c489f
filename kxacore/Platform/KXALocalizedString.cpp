#include "kxacore/Platform/KXALocalizedString.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <fstream>
#include <map>
#include <optional>
#include <mutex>
#include <shared_mutex>
#include <utility>

#include <nlohmann/json.hpp>

namespace {

struct Entry {
  std::string_view key;
  std::string_view text;
};

constexpr Entry kEnglish[] = {
#include "kxacore/Platform/KXALocalizedStringsEnglish.inc"
};

constexpr bool isSortedByKey() {
  for (std::size_t i = 1; i < std::size(kEnglish); ++i) {
    if (!(kEnglish[i - 1].key < kEnglish[i].key)) return false;
  }
  return true;
}
static_assert(isSortedByKey(), "the English table must stay sorted by key, without repeats");

const Entry* findBuiltIn(std::string_view key) {
  const auto* found = std::lower_bound(std::begin(kEnglish), std::end(kEnglish), key,
                                       [](const Entry& e, std::string_view k) { return e.key < k; });
  return found != std::end(kEnglish) && found->key == key ? found : nullptr;
}

// Overrides loaded at run time; guarded by overridesMutex().
std::map<std::string, std::string, std::less<>>& overrides() {
  static auto& table = *new std::map<std::string, std::string, std::less<>>();
  return table;
}
std::shared_mutex& overridesMutex() {
  static auto& mutex = *new std::shared_mutex();
  return mutex;
}
std::atomic<std::uint64_t> gGeneration{1};
// Fast path: most processes never load overrides, so skip the lock entirely.
std::atomic<bool> gHasOverrides{false};

std::optional<std::string> lookup(std::string_view key) {
  if (gHasOverrides.load(std::memory_order_acquire)) {
    std::shared_lock lock(overridesMutex());
    const auto& table = overrides();
    if (auto it = table.find(key); it != table.end()) return it->second;
  }
  if (const Entry* entry = findBuiltIn(key)) return std::string(entry->text);
  return std::nullopt;
}

}  // namespace

std::string KXALocalizedString(std::string_view key) {
  return lookup(key).value_or(std::string(key));
}

std::string KXALocalizedStringOr(std::string_view key, std::string_view fallback) {
  return lookup(key).value_or(std::string(fallback));
}

bool KXAHasLocalizedString(std::string_view key) { return lookup(key).has_value(); }

bool KXALocalizedStrings::loadOverridesFromFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return false;
  const nlohmann::json document = nlohmann::json::parse(in, nullptr, /*allow_exceptions=*/false);
  if (!document.is_object()) return false;
  std::map<std::string, std::string, std::less<>> loaded;
  for (const auto& [key, value] : document.items()) {
    if (!value.is_string()) return false;
    loaded.emplace(key, value.get<std::string>());
  }
  {
    std::unique_lock lock(overridesMutex());
    for (auto& [key, value] : loaded) overrides().insert_or_assign(key, std::move(value));
    gHasOverrides.store(!overrides().empty(), std::memory_order_release);
  }
  gGeneration.fetch_add(1);
  return true;
}

void KXALocalizedStrings::setOverride(std::string_view key, std::string_view text) {
  {
    std::unique_lock lock(overridesMutex());
    overrides().insert_or_assign(std::string(key), std::string(text));
    gHasOverrides.store(true, std::memory_order_release);
  }
  gGeneration.fetch_add(1);
}

void KXALocalizedStrings::resetOverrides() {
  {
    std::unique_lock lock(overridesMutex());
    overrides().clear();
    gHasOverrides.store(false, std::memory_order_release);
  }
  gGeneration.fetch_add(1);
}

std::uint64_t KXALocalizedStrings::generation() { return gGeneration.load(); }
