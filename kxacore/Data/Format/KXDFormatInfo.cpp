#include "kxacore/Data/Format/KXDFormatInfo.h"

#include <cstdlib>
#include <utility>

#include "kxacore/RegExp/KXCRegExp.h"

namespace {

// Compiles one of the engine's fixed expressions; they are known to compile.
const KXCRegExp& fixedPattern(std::string_view pattern) {
  auto compiled = KXCRegExp::regExpWithPattern(pattern);
  if (!compiled) std::abort();  // a build without a working POSIX engine is unusable
  return *compiled.release();   // lives for the whole process, never freed
}

struct TermsCacheState {
  std::mutex mu;  // guards pieces (the pointer; the map it points to is immutable)
  std::shared_ptr<const KXDTermsPatternCache> pieces = std::make_shared<KXDTermsPatternCache>();
};

TermsCacheState& termsCacheState() {
  static auto& state = *new TermsCacheState();
  return state;
}

}  // namespace

KXDFormatInfo::KXDFormatInfo(std::string_view defaultFormat)
    : KXDFormatInfo(defaultFormat, "KXDFormatInfo") {}

KXDFormatInfo::KXDFormatInfo(std::string_view defaultFormat, std::string cacheKey)
    : defaultFormat_(std::string(defaultFormat)), cacheKey_(std::move(cacheKey)) {}

KXDFormatInfo::KXDFormatInfo(const KXDFormatInfo& other)
    : defaultFormat_(other.defaultFormat()), cacheKey_(other.cacheKey_) {}

KXDFormatInfo::~KXDFormatInfo() = default;

std::unique_ptr<KXDFormatInfo> KXDFormatInfo::clone() const {
  return std::unique_ptr<KXDFormatInfo>(new KXDFormatInfo(*this));
}

std::optional<std::string> KXDFormatInfo::defaultFormat() const {
  std::scoped_lock lock(mu_);
  return defaultFormat_;
}

void KXDFormatInfo::setDefaultFormat(std::optional<std::string> format) {
  std::scoped_lock lock(mu_);
  defaultFormat_ = std::move(format);
}

std::shared_ptr<KXDFormatCache> KXDFormatInfo::cache() const {
  std::scoped_lock lock(mu_);
  return cache_;
}

void KXDFormatInfo::setCache(std::shared_ptr<KXDFormatCache> cache) {
  std::scoped_lock lock(mu_);
  cache_ = std::move(cache);
}

std::optional<std::string> KXDFormatInfo::stringForObject(KXDFormatObject object,
                                                          std::optional<std::string_view> format,
                                                          KXDFormatInfo* provider) {
  KXDFormatInfo* const effective = provider ? provider : this;
  // Both objects' per-call state is touched; std::lock orders the two locks
  // so that two threads crossing receiver and provider cannot deadlock.
  std::unique_lock<std::recursive_mutex> ownLock(mu_, std::defer_lock);
  std::unique_lock<std::recursive_mutex> providerLock(effective->mu_, std::defer_lock);
  if (effective == this) {
    ownLock.lock();
  } else {
    std::lock(ownLock, providerLock);
  }

  std::string_view effectiveFormat = kKXDFormatInfoGeneralFormat;
  if (format) {
    effectiveFormat = *format;
  } else if (effective->defaultFormat_) {
    effectiveFormat = *effective->defaultFormat_;  // stable: the provider is locked
  }

  const auto compute = [&]() -> std::optional<std::string> {
    auto inner = effective->innerStringForObject(object, effectiveFormat, provider);
    if (!inner) return std::nullopt;
    return effective->postFormat(std::move(*inner));
  };

  // The receiver's cache switches caching on; the provider's cache holds the
  // entries. A provider without one therefore never hits, and a provider's
  // cache is left alone by a receiver that caches nothing.
  if (!cache_) return compute();
  // Held by value: a hook could install another cache during the call.
  const std::shared_ptr<KXDFormatCache> cache = effective->cache_;
  if (!cache) return compute();
  const std::optional<std::string> objectKey = effective->cacheKeyForObject(object);
  if (!objectKey) return compute();

  // Taken out of the member so that a nested call on this formatter (a hook
  // formatting again) cannot overwrite it; its capacity comes back after.
  std::string key = std::move(keyScratch_);
  key.clear();
  key.append(cacheKey_).append(":").append(*objectKey).append(":").append(effectiveFormat);
  std::optional<std::string> result;
  if (const auto hit = cache->find(key); hit != cache->end()) {
    result = hit->second;
  } else {
    result = compute();
    if (result) cache->insert_or_assign(key, *result);
  }
  keyScratch_ = std::move(key);
  return result;
}

void KXDFormatInfo::flushCache() {
  std::scoped_lock lock(mu_);
  if (cache_) cache_->clear();
}

void KXDFormatInfo::flushCacheForObject(KXDFormatObject object) {
  std::scoped_lock lock(mu_);
  if (!cache_) return;
  const std::optional<std::string> objectKey = cacheKeyForObject(object);
  if (!objectKey) return;
  std::erase_if(*cache_, [&](const auto& entry) {
    return entry.first.find(*objectKey) != std::string::npos;
  });
}

std::optional<std::string> KXDFormatInfo::cacheKeyForObject(KXDFormatObject /*object*/) const {
  return std::nullopt;
}

std::optional<std::string> KXDFormatInfo::innerStringForObject(KXDFormatObject object,
                                                               std::string_view format,
                                                               KXDFormatInfo* /*provider*/) {
  const std::shared_ptr<const KXDTermsPatternCache> known = termsPatternCache();
  const KXDTermPieces* pieces = nullptr;
  KXDTermPieces fresh;
  if (const auto it = known->find(format); it != known->end()) {
    pieces = &it->second;  // `known` keeps the map alive for this call
  } else {
    termsPattern().enumerateAllMatches(format, [&](bool isMatch, std::string_view piece) {
      fresh.push_back({isMatch, std::string(piece)});
    });
    pieces = &fresh;
  }

  std::string result;
  result.reserve(format.size() + 16);
  std::any context;
  bool haveContext = false;
  for (const KXDTermPatternMatchResult& piece : *pieces) {
    if (!piece.match) {
      result.append(piece.part);
      continue;
    }
    if (!haveContext) {
      context = contextInfoForObject(object);
      haveContext = true;
    }
    if (std::optional<std::string> replacement = replaceTerm(piece.part, context)) {
      result.append(*replacement);
    }
  }

  if (pieces == &fresh && !fresh.empty()) {
    // Copy on write: readers keep using the map they hold. Re-read under the
    // lock so that a format added meanwhile by another thread is not lost.
    TermsCacheState& state = termsCacheState();
    std::scoped_lock lock(state.mu);
    if (!state.pieces->contains(format)) {
      auto grown = std::make_shared<KXDTermsPatternCache>(*state.pieces);
      grown->emplace(std::string(format), std::move(fresh));
      state.pieces = std::move(grown);
    }
  }
  return result;
}

std::any KXDFormatInfo::contextInfoForObject(KXDFormatObject /*object*/) const { return {}; }

std::optional<std::string> KXDFormatInfo::replaceTerm(std::string_view term,
                                                      const std::any& /*contextInfo*/) {
  return std::string(term);
}

std::string KXDFormatInfo::postFormat(std::string text) const { return text; }

bool KXDFormatInfo::collapseAsciiWhitespaceInPlace(std::string& text) {
  for (const char c : text) {
    if (static_cast<unsigned char>(c) >= 0x80 || c == '\0') return false;
  }
  const auto isSpace = [](char c) {
    return c == ' ' || (c >= '\t' && c <= '\r');  // [[:space:]] in every locale
  };
  // The text only shrinks, so it is rewritten in place.
  std::size_t out = 0;
  std::size_t i = 0;
  while (i < text.size()) {
    if (!isSpace(text[i])) {
      text[out++] = text[i++];
      continue;
    }
    std::size_t end = i;
    bool newline = false;
    for (; end < text.size() && isSpace(text[end]); ++end) newline = newline || text[end] == '\n';
    text[out++] = end - i >= 2 ? (newline ? '\n' : ' ') : text[i];
    i = end;
  }
  text.resize(out);
  return true;
}

std::string KXDFormatInfo::collapseWhitespaceInString(std::string_view text) {
  std::string result(text);
  if (collapseAsciiWhitespaceInPlace(result)) return result;
  return collapsePattern().replaceAllMatchesWithStringEvaluator(
      text, [](std::string_view run) -> std::optional<std::string> {
        return std::string(run.find('\n') != std::string_view::npos ? "\n" : " ");
      });
}

const KXCRegExp& KXDFormatInfo::termsPattern() {
  static const KXCRegExp& pattern = fixedPattern("[a-zA-Z_0-9]+");
  return pattern;
}

const KXCRegExp& KXDFormatInfo::collapsePattern() {
  static const KXCRegExp& pattern = fixedPattern("[[:space:]][[:space:]]+");
  return pattern;
}

std::shared_ptr<const KXDTermsPatternCache> KXDFormatInfo::termsPatternCache() {
  TermsCacheState& state = termsCacheState();
  std::scoped_lock lock(state.mu);
  return state.pieces;
}

void KXDFormatInfo::setTermsPatternCache(std::shared_ptr<const KXDTermsPatternCache> cache) {
  TermsCacheState& state = termsCacheState();
  std::scoped_lock lock(state.mu);
  state.pieces = cache ? std::move(cache) : std::make_shared<KXDTermsPatternCache>();
}
