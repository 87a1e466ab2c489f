#include "kxacore/Platform/KXAUserDefaults.h"

#include <fstream>
#include <map>
#include <mutex>
#include <variant>

#include <nlohmann/json.hpp>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Platform/KXAFileUtilities.h"

namespace {

using Value = std::variant<std::int64_t, std::string>;
using Store = std::map<std::string, Value, std::less<>>;

struct Defaults {
  std::mutex mutex;  // guards store
  Store store;
};

Defaults& defaults() {
  static auto& instance = *new Defaults();
  return instance;
}

}  // namespace

std::int64_t KXAUserDefaults::integerForKey(std::string_view key) {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  const auto it = d.store.find(key);
  if (it == d.store.end()) return 0;
  if (const auto* number = std::get_if<std::int64_t>(&it->second)) return *number;
  return kxa_integerValue(std::get<std::string>(it->second));
}

std::optional<std::string> KXAUserDefaults::stringForKey(std::string_view key) {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  const auto it = d.store.find(key);
  if (it == d.store.end()) return std::nullopt;
  if (const auto* number = std::get_if<std::int64_t>(&it->second)) return std::to_string(*number);
  return std::get<std::string>(it->second);
}

void KXAUserDefaults::setInteger(std::string_view key, std::int64_t value) {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  d.store.insert_or_assign(std::string(key), Value(value));
}

void KXAUserDefaults::setString(std::string_view key, std::string_view value) {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  d.store.insert_or_assign(std::string(key), Value(std::string(value)));
}

void KXAUserDefaults::removeObjectForKey(std::string_view key) {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  if (const auto it = d.store.find(key); it != d.store.end()) d.store.erase(it);
}

void KXAUserDefaults::reset() {
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  d.store.clear();
}

bool KXAUserDefaults::loadFromFile(const std::filesystem::path& path) {
  std::ifstream in(path, std::ios::binary);
  if (!in) return false;
  const nlohmann::json document = nlohmann::json::parse(in, nullptr, /*allow_exceptions=*/false);
  if (!document.is_object()) return false;
  Store loaded;
  for (const auto& [key, value] : document.items()) {
    if (value.is_number_integer()) {
      loaded.emplace(key, Value(value.get<std::int64_t>()));
    } else if (value.is_string()) {
      loaded.emplace(key, Value(value.get<std::string>()));
    } else {
      return false;
    }
  }
  auto& d = defaults();
  std::scoped_lock lock(d.mutex);
  d.store = std::move(loaded);
  return true;
}

bool KXAUserDefaults::saveToFile(const std::filesystem::path& path) {
  nlohmann::ordered_json document = nlohmann::ordered_json::object();
  {
    auto& d = defaults();
    std::scoped_lock lock(d.mutex);
    for (const auto& entry : d.store) {
      std::visit([&](const auto& v) { document[entry.first] = v; }, entry.second);
    }
  }
  const std::string text =
      document.dump(2, ' ', false, nlohmann::ordered_json::error_handler_t::replace) + "\n";
  return KXAWriteFileAtomically(path, text);
}
