#include "kxacore/Platform/KXALocale.h"

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <map>
#include <memory>
#include <mutex>
#include <shared_mutex>

#include <unicode/dtfmtsym.h>
#include <unicode/locid.h>
#include <unicode/stringoptions.h>
#include <unicode/unistr.h>

namespace {

struct LocaleState {
  std::shared_mutex mutex;  // guards overrideIdentifier and the two caches
  std::string overrideIdentifier;
  std::map<std::string, std::unique_ptr<KXAMonthNames>, std::less<>> fullNames;
  std::map<std::string, std::unique_ptr<KXAMonthNames>, std::less<>> shortNames;
};

LocaleState& state() {
  static auto& instance = *new LocaleState();
  return instance;
}

// "de_DE.UTF-8@euro" -> "de_DE"; "C" and "POSIX" mean no preference.
std::string cleanIdentifier(std::string_view raw) {
  std::string identifier(raw.substr(0, raw.find_first_of(".@")));
  if (identifier == "C" || identifier == "POSIX") identifier.clear();
  return identifier;
}

std::string environmentIdentifier() {
  for (const char* variable : {"KXA_LOCALE", "LC_ALL", "LC_MESSAGES", "LANG"}) {
    if (const char* value = std::getenv(variable); value && *value) {
      std::string identifier = cleanIdentifier(value);
      if (!identifier.empty()) return identifier;
    }
  }
  return "en_US";
}

std::string toUTF8(const icu::UnicodeString& text) {
  std::string utf8;
  text.toUTF8String(utf8);
  return utf8;
}

std::unique_ptr<KXAMonthNames> loadMonthNames(const std::string& identifier, bool abbreviated) {
  auto names = std::make_unique<KXAMonthNames>();
  UErrorCode status = U_ZERO_ERROR;
  const icu::DateFormatSymbols symbols(icu::Locale(identifier.c_str()), status);
  if (U_FAILURE(status)) return names;
  int32_t count = 0;
  const icu::UnicodeString* months = symbols.getMonths(
      count, icu::DateFormatSymbols::FORMAT,
      abbreviated ? icu::DateFormatSymbols::ABBREVIATED : icu::DateFormatSymbols::WIDE);
  for (int32_t i = 0; i < count && i < 12; ++i) {
    std::string name = toUTF8(months[i]);
    if (abbreviated && !name.empty() && name.back() == '.') name.pop_back();
    (*names)[static_cast<std::size_t>(i)] = std::move(name);
  }
  return names;
}

const KXAMonthNames& cachedMonthNames(std::string_view identifier, bool abbreviated) {
  auto& s = state();
  auto& cache = abbreviated ? s.shortNames : s.fullNames;
  {
    std::shared_lock lock(s.mutex);
    if (const auto it = cache.find(identifier); it != cache.end()) return *it->second;
  }
  auto names = loadMonthNames(std::string(identifier), abbreviated);
  std::unique_lock lock(s.mutex);
  // Entries are never erased, so the reference stays valid for the process.
  auto [it, inserted] = cache.try_emplace(std::string(identifier), std::move(names));
  return *it->second;
}

bool isAscii(std::string_view text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) >= 0x80) return false;
  }
  return true;
}

char asciiFold(char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c + 32) : c; }

bool isTurkic(std::string_view identifier) {
  const std::string_view language = identifier.substr(0, identifier.find_first_of("_-"));
  return language == "tr" || language == "az";
}

// Comparison is a hot path of the parsers: keep the current locale's Turkic
// flag at hand instead of copying the identifier on every call.
std::atomic<int> gCurrentTurkic{-1};  // -1 unknown, 0 no, 1 yes

bool currentLocaleIsTurkic() {
  int flag = gCurrentTurkic.load(std::memory_order_relaxed);
  if (flag < 0) {
    flag = isTurkic(KXALocale::currentLocaleIdentifier()) ? 1 : 0;
    gCurrentTurkic.store(flag, std::memory_order_relaxed);
  }
  return flag == 1;
}

}  // namespace

std::string KXALocale::currentLocaleIdentifier() {
  {
    auto& s = state();
    std::shared_lock lock(s.mutex);
    if (!s.overrideIdentifier.empty()) return s.overrideIdentifier;
  }
  static const std::string fromEnvironment = environmentIdentifier();
  return fromEnvironment;
}

void KXALocale::setCurrentLocaleIdentifier(std::string_view identifier) {
  auto& s = state();
  std::unique_lock lock(s.mutex);
  s.overrideIdentifier = cleanIdentifier(identifier);
  gCurrentTurkic.store(-1, std::memory_order_relaxed);
}

std::string KXALocale::languageCode(std::string_view identifier) {
  const std::string id = identifier.empty() ? currentLocaleIdentifier() : std::string(identifier);
  return id.substr(0, id.find_first_of("_-"));
}

const KXAMonthNames& KXALocale::monthNames(std::string_view identifier) {
  return cachedMonthNames(identifier, false);
}

const KXAMonthNames& KXALocale::shortMonthNames(std::string_view identifier) {
  return cachedMonthNames(identifier, true);
}

int KXALocale::caseInsensitiveCompare(std::string_view a, std::string_view b,
                                      std::string_view identifier) {
  const bool turkic = identifier.empty() ? currentLocaleIsTurkic() : isTurkic(identifier);
  // ASCII folding equals full folding for ASCII text, except Turkic I/i.
  if (!turkic && isAscii(a) && isAscii(b)) {
    const std::size_t common = std::min(a.size(), b.size());
    for (std::size_t i = 0; i < common; ++i) {
      const char x = asciiFold(a[i]);
      const char y = asciiFold(b[i]);
      if (x != y) return static_cast<unsigned char>(x) < static_cast<unsigned char>(y) ? -1 : 1;
    }
    return a.size() == b.size() ? 0 : (a.size() < b.size() ? -1 : 1);
  }
  const auto left = icu::UnicodeString::fromUTF8(icu::StringPiece(a.data(), static_cast<int32_t>(a.size())));
  const auto right = icu::UnicodeString::fromUTF8(icu::StringPiece(b.data(), static_cast<int32_t>(b.size())));
  const uint32_t options = turkic ? U_FOLD_CASE_EXCLUDE_SPECIAL_I : U_FOLD_CASE_DEFAULT;
  const int8_t order = left.caseCompare(right, options);
  return order < 0 ? -1 : (order > 0 ? 1 : 0);
}
