// File: KXDFormatInfo.h
//
// KXDFormatInfo is the template engine behind every displayed genealogical
// value. A format string is split into terms (runs of ASCII letters, digits
// and "_") and the literal text between them; each term is handed to
// replaceTerm(), whose answer replaces it, and the literal text is kept:
//
//   format "Mmmm of yyyy"  ->  term "Mmmm", literal " ", term "of",
//                              literal " ", term "yyyy"
//
// Subclasses (the date and place formatters) override the hooks below. The
// base class replaces every term by itself, so it prints a format unchanged.
//
// A result cache is off until the owner installs one with setCache(); cache
// keys are "<class key>:<object key>:<format>", and the class key keeps
// formatters of different classes apart when they share one map.
//
// The split of a format into pieces is kept for the whole process (one
// entry per distinct format string), so after the first use of a format no
// expression runs and nothing is allocated to split it.
//
// Thread safety: stringForObject() locks the receiver (and a distinct
// provider) for the whole call, so one formatter may serve many threads.
// Setters lock too. A cache map shared by several formatters is guarded only
// by the lock of the formatter using it: share one map only among formatters
// used on one thread at a time. Formatters have identity: they are not
// copyable; clone() makes an independent copy (without the cache).
#pragma once

#include <any>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "kxacore/Data/Format/KXDFormatObject.h"

class KXCRegExp;

// One piece of a format string: a term (match) or the literal text between
// terms.
struct KXDTermPatternMatchResult {
  bool match = false;
  std::string part;

  friend bool operator==(const KXDTermPatternMatchResult&,
                         const KXDTermPatternMatchResult&) = default;
};

// Hash for string-keyed maps that may be searched with a string_view
// without building a std::string.
struct KXDStringHash {
  using is_transparent = void;
  std::size_t operator()(std::string_view text) const noexcept {
    return std::hash<std::string_view>{}(text);
  }
};

using KXDTermPieces = std::vector<KXDTermPatternMatchResult>;
// Format string to its pieces.
using KXDTermsPatternCache =
    std::unordered_map<std::string, KXDTermPieces, KXDStringHash, std::equal_to<>>;
// Full cache key to display text.
using KXDFormatCache = std::unordered_map<std::string, std::string, KXDStringHash, std::equal_to<>>;

// The format every formatter falls back to. Dates and places both name it
// kKXDFormatGeneral; it lives here so neither has to include the other.
inline constexpr std::string_view kKXDFormatInfoGeneralFormat = "G";
inline constexpr std::string_view kKXDFormatGeneral = kKXDFormatInfoGeneralFormat;

class KXDFormatInfo {
 public:
  // A formatter whose default format is `defaultFormat`; no cache.
  explicit KXDFormatInfo(std::string_view defaultFormat = kKXDFormatInfoGeneralFormat);
  virtual ~KXDFormatInfo();

  KXDFormatInfo& operator=(const KXDFormatInfo&) = delete;

  // A new formatter of the same class with the same settings and no cache.
  [[nodiscard]] virtual std::unique_ptr<KXDFormatInfo> clone() const;

  // The format used when a call names none; nullopt means "G".
  [[nodiscard]] std::optional<std::string> defaultFormat() const;
  void setDefaultFormat(std::optional<std::string> format);

  // The result cache; nullptr (the default) turns caching off.
  [[nodiscard]] std::shared_ptr<KXDFormatCache> cache() const;
  void setCache(std::shared_ptr<KXDFormatCache> cache);
  // Prefix of every cache key: the class name ("KXDFormatInfo",
  // "KXDDateFormatInfo" ...). Fixed at construction.
  [[nodiscard]] const std::string& cacheKey() const noexcept { return cacheKey_; }

  // The display text of `object`: the public entry point.
  //   format: nullopt uses the provider's default format, then "G".
  //   provider: the formatter whose hooks do the work (cacheKeyForObject,
  //     innerStringForObject, postFormat, its default format and cache);
  //     nullptr means this formatter. It is locked with the receiver and
  //     must stay alive for the call. Results are cached only when both
  //     this formatter and the provider have a cache (entries go to the
  //     provider's).
  // nullopt only when the provider's innerStringForObject() gives none.
  [[nodiscard]] std::optional<std::string> stringForObject(
      KXDFormatObject object, std::optional<std::string_view> format = std::nullopt,
      KXDFormatInfo* provider = nullptr);

  // Empties the cache.
  void flushCache();
  // Removes every cache entry whose key CONTAINS the object's key: flushing
  // the date with key "12" also drops the entries of "123". Deliberately
  // broad: a stale text costs more than recomputing a few.
  void flushCacheForObject(KXDFormatObject object);

  // ---- Hooks for subclasses -----------------------------------------------

  // The key of the object's display value; nullopt (the base answer) means
  // the object is never cached.
  [[nodiscard]] virtual std::optional<std::string> cacheKeyForObject(KXDFormatObject object) const;
  // The text before postFormat(): the term substitution (see the file
  // comment). Subclasses override it and call this one for user formats.
  // `provider` is the argument given to stringForObject (may be nullptr).
  [[nodiscard]] virtual std::optional<std::string> innerStringForObject(
      KXDFormatObject object, std::string_view format, KXDFormatInfo* provider);
  // Per-call context handed to every replaceTerm() of one substitution;
  // computed at the first term only. The base has none (an empty any).
  [[nodiscard]] virtual std::any contextInfoForObject(KXDFormatObject object) const;
  // The text that replaces `term`; nullopt drops the term. The base keeps
  // the term as written.
  [[nodiscard]] virtual std::optional<std::string> replaceTerm(std::string_view term,
                                                               const std::any& contextInfo);
  // Applied to every finished text; the base returns it unchanged.
  [[nodiscard]] virtual std::string postFormat(std::string text) const;

  // Every run of two or more white-space characters becomes "\n" when it
  // holds a line feed, else one space.
  [[nodiscard]] static std::string collapseWhitespaceInString(std::string_view text);
  // The same, in place, for ASCII text without NUL bytes (where it needs no
  // expression); returns false and leaves other text unchanged.
  static bool collapseAsciiWhitespaceInPlace(std::string& text);

  // ---- Class-wide state ---------------------------------------------------

  // "[a-zA-Z_0-9]+": what a term is.
  [[nodiscard]] static const KXCRegExp& termsPattern();
  // "[[:space:]][[:space:]]+": what collapseWhitespaceInString() collapses.
  [[nodiscard]] static const KXCRegExp& collapsePattern();
  // The process-wide split of formats into pieces. Immutable: adding a
  // format installs a new map (copy on write).
  [[nodiscard]] static std::shared_ptr<const KXDTermsPatternCache> termsPatternCache();
  // Replaces it wholesale (nullptr empties it).
  static void setTermsPatternCache(std::shared_ptr<const KXDTermsPatternCache> cache);

 protected:
  // For subclasses: `cacheKey` is the subclass's name.
  KXDFormatInfo(std::string_view defaultFormat, std::string cacheKey);
  // For clone(): copies the default format and the cache key, not the cache.
  KXDFormatInfo(const KXDFormatInfo& other);

  // Guards every member below and the per-call state of subclasses. Recursive
  // because a hook may format again through its own formatter.
  mutable std::recursive_mutex mu_;

 private:
  std::optional<std::string> defaultFormat_;  // guarded by mu_
  std::shared_ptr<KXDFormatCache> cache_;     // guarded by mu_
  std::string keyScratch_;                    // guarded by mu_; keeps its capacity across calls
  const std::string cacheKey_;
};
