#include "kxacore/RegExp/KXCRegExpPerl.h"

#define PCRE2_CODE_UNIT_WIDTH 8
#include <pcre2.h>

#include <algorithm>
#include <array>
#include <limits>
#include <utility>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/RegExp/KXCRegExpInternal.h"

namespace {

// The result vector holds 32-bit offsets, as the older interface did.
constexpr std::size_t kMaxSubject = static_cast<std::size_t>(std::numeric_limits<int>::max());

struct OptionMapping {
  int old;
  std::uint32_t pcre2;
};

constexpr std::array<OptionMapping, 11> kOptionMappings{{
    {KXCRegExpPerl::kCaseless, PCRE2_CASELESS},
    {KXCRegExpPerl::kMultiline, PCRE2_MULTILINE},
    {KXCRegExpPerl::kDotAll, PCRE2_DOTALL},
    {KXCRegExpPerl::kExtended, PCRE2_EXTENDED},
    {KXCRegExpPerl::kAnchored, PCRE2_ANCHORED},
    {KXCRegExpPerl::kDollarEndOnly, PCRE2_DOLLAR_ENDONLY},
    {KXCRegExpPerl::kUngreedy, PCRE2_UNGREEDY},
    {KXCRegExpPerl::kUTF8, PCRE2_UTF},
    {KXCRegExpPerl::kNoAutoCapture, PCRE2_NO_AUTO_CAPTURE},
    {KXCRegExpPerl::kFirstLine, PCRE2_FIRSTLINE},
    {KXCRegExpPerl::kDupNames, PCRE2_DUPNAMES},
}};

constexpr int knownOptions() {
  int all = 0;
  for (const auto& mapping : kOptionMappings) all |= mapping.old;
  return all;
}

// PCRE2 reads the subject through a pointer even for an empty one.
PCRE2_SPTR bytesOf(std::string_view text) {
  return reinterpret_cast<PCRE2_SPTR>(text.data() ? text.data() : "");
}

std::string errorMessage(int code) {
  std::array<PCRE2_UCHAR, 256> buffer{};
  if (pcre2_get_error_message(code, buffer.data(), buffer.size()) < 0) return "unknown error";
  return std::string(reinterpret_cast<const char*>(buffer.data()));
}

}  // namespace

struct KXCRegExpPerl::Compiled {
  pcre2_code* code = nullptr;
  pcre2_match_data* matchData = nullptr;  // reused by every search
  bool jit = false;
  std::int64_t numGroups = 1;

  Compiled() = default;
  Compiled(const Compiled&) = delete;
  Compiled& operator=(const Compiled&) = delete;
  ~Compiled() {
    pcre2_match_data_free(matchData);
    pcre2_code_free(code);
  }
};

// ---------------------------------------------------------------------------
// KXCRegExpPerlMatch

KXCRegExpPerlMatch::KXCRegExpPerlMatch(std::shared_ptr<const std::string> content,
                                       std::int64_t numGroups, std::span<const int> matches)
    : content_(std::move(content)),
      numGroups_(std::max<std::int64_t>(numGroups, 0)),
      matches_(static_cast<std::size_t>(numGroups_) * 3, -1) {
  std::copy_n(matches.begin(), std::min(matches.size(), matches_.size()), matches_.begin());
}

const std::string& KXCRegExpPerlMatch::content() const {
  static const std::string& empty = *new std::string();
  return content_ ? *content_ : empty;
}

std::optional<std::string> KXCRegExpPerlMatch::stringForMatchAtIndex(std::int64_t index) const {
  if (index < 0 || index >= numGroups_) return std::nullopt;
  const int start = matches_[static_cast<std::size_t>(index) * 2];
  const int end = matches_[static_cast<std::size_t>(index) * 2 + 1];
  return kxc_internal::decodedText(kxc_internal::bytesInRange(content(), start, end));
}

// ---------------------------------------------------------------------------
// KXCRegExpPerl

KXCRegExpPerl::KXCRegExpPerl(std::string pattern, int options, std::unique_ptr<Compiled> compiled)
    : pattern_(std::move(pattern)),
      options_(options),
      compiled_(std::move(compiled)),
      resultVector_(static_cast<std::size_t>(compiled_->numGroups) * 3, 0) {
  resultVector_[0] = resultVector_[1] = -1;
}

KXCRegExpPerl::~KXCRegExpPerl() = default;

std::unique_ptr<KXCRegExpPerl> KXCRegExpPerl::regExpWithPattern(std::string_view pattern,
                                                                int options, std::string* error) {
  return make(pattern, options, error, true);
}

std::unique_ptr<KXCRegExpPerl> KXCRegExpPerl::interpretedRegExpWithPattern(std::string_view pattern,
                                                                           int options,
                                                                           std::string* error) {
  return make(pattern, options, error, false);
}

std::unique_ptr<KXCRegExpPerl> KXCRegExpPerl::make(std::string_view pattern, int options,
                                                   std::string* error, bool useJIT) {
  options |= kUTF8;
  if ((options & ~knownOptions()) != 0) {
    if (error) *error = "unsupported option bits";
    return nullptr;
  }
  std::uint32_t flags = 0;
  for (const auto& mapping : kOptionMappings) {
    if (options & mapping.old) flags |= mapping.pcre2;
  }

  auto compiled = std::make_unique<Compiled>();
  int code = 0;
  PCRE2_SIZE offset = 0;
  compiled->code = pcre2_compile(bytesOf(pattern), pattern.size(), flags, &code, &offset, nullptr);
  if (!compiled->code) {
    if (error) *error = "at offset " + std::to_string(offset) + ": " + errorMessage(code);
    return nullptr;
  }
  std::uint32_t captures = 0;
  pcre2_pattern_info(compiled->code, PCRE2_INFO_CAPTURECOUNT, &captures);
  compiled->numGroups = static_cast<std::int64_t>(captures) + 1;
  compiled->matchData = pcre2_match_data_create_from_pattern(compiled->code, nullptr);
  if (!compiled->matchData) {
    if (error) *error = "out of memory";
    return nullptr;
  }
  // The interpreter gives the same results, only slower, so a JIT failure
  // (no executable memory, unsupported platform) is not an error.
  compiled->jit = useJIT && pcre2_jit_compile(compiled->code, PCRE2_JIT_COMPLETE) == 0;
  // make_unique cannot reach the private constructor.
  return std::unique_ptr<KXCRegExpPerl>(
      new KXCRegExpPerl(std::string(pattern), options, std::move(compiled)));
}

bool KXCRegExpPerl::usesJIT() const { return compiled_->jit; }

std::int64_t KXCRegExpPerl::numGroups() const { return compiled_->numGroups; }

bool KXCRegExpPerl::search(std::string_view subject, std::size_t startFrom, bool checked) {
  const std::size_t pairs = static_cast<std::size_t>(compiled_->numGroups);
  int rc = PCRE2_ERROR_NOMATCH;
  if (subject.size() <= kMaxSubject && startFrom <= subject.size()) {
    const std::uint32_t flags = checked ? PCRE2_NO_UTF_CHECK : 0;
    rc = pcre2_match(compiled_->code, bytesOf(subject), subject.size(), startFrom, flags,
                     compiled_->matchData, nullptr);
    // The JIT runs on a small fixed stack; the interpreter's frames live on
    // the heap and get much further on deeply nested patterns.
    if (rc == PCRE2_ERROR_JIT_STACKLIMIT) {
      rc = pcre2_match(compiled_->code, bytesOf(subject), subject.size(), startFrom,
                       flags | PCRE2_NO_JIT, compiled_->matchData, nullptr);
    }
  }
  if (rc < 0) {
    // Invalid UTF-8, limits and bad offsets count as no match.
    for (std::size_t i = 0; i < pairs * 2; ++i) resultVector_[i] = -1;
    return false;
  }
  const PCRE2_SIZE* ovector = pcre2_get_ovector_pointer(compiled_->matchData);
  const std::size_t available = pcre2_get_ovector_count(compiled_->matchData);
  for (std::size_t i = 0; i < pairs; ++i) {
    const bool took = i < available && ovector[i * 2] != PCRE2_UNSET;
    resultVector_[i * 2] = took ? static_cast<int>(ovector[i * 2]) : -1;
    resultVector_[i * 2 + 1] = took ? static_cast<int>(ovector[i * 2 + 1]) : -1;
  }
  return true;
}

bool KXCRegExpPerl::executeForString(std::string_view subject, int startFrom) {
  if (startFrom < 0) return search(subject, std::numeric_limits<std::size_t>::max(), false);
  return search(subject, static_cast<std::size_t>(startFrom), false);
}

template <class Unmatched, class Matched>
void KXCRegExpPerl::scan(std::string_view subject, Unmatched&& unmatched, Matched&& matched) {
  std::size_t pos = 0;         // where the next search starts
  std::size_t pieceStart = 0;  // start of the pending unmatched piece
  bool checked = false;
  while (pos < subject.size()) {
    if (!search(subject, pos, checked)) break;
    const auto matchStart = static_cast<std::size_t>(resultVector_[0]);
    const auto matchEnd = static_cast<std::size_t>(resultVector_[1]);
    // \K can report a match that ends before it starts; never step backwards.
    if (matchStart < pieceStart || matchEnd < matchStart) break;
    if (matchStart != pieceStart) unmatched(pieceStart, matchStart);
    matched();
    pieceStart = matchEnd;
    // An empty match would be found again at the same place forever.
    pos = matchEnd != matchStart ? matchEnd : kxc_internal::nextCharacter(subject, matchEnd);
    // A search that returned a result has validated the UTF-8 of the whole
    // subject; doing it again per match would make scans quadratic. The
    // engine may skip that check only from a character boundary, which \C
    // can leave behind; from inside a character the search then fails.
    checked = kxc_internal::isCharacterBoundary(subject, pos);
  }
  if (pieceStart < subject.size()) unmatched(pieceStart, subject.size());
}

bool KXCRegExpPerl::matchesString(std::string_view subject) { return search(subject, 0, false); }

bool KXCRegExpPerl::matchesFullString(std::string_view subject) {
  // Only the span of the whole-match pair counts, as it always has: a failed
  // search leaves -1, -1, a span of 0, so an empty subject passes whatever
  // the pattern. Callers that care test for an empty subject first.
  static_cast<void>(search(subject, 0, false));
  return std::int64_t{resultVector_[1]} - resultVector_[0] ==
         static_cast<std::int64_t>(subject.size());
}

std::string KXCRegExpPerl::replaceAllMatches(std::string_view subject,
                                             std::string_view replacement) {
  std::string result;
  scan(
      subject,
      [&](std::size_t begin, std::size_t end) { result.append(subject, begin, end - begin); },
      [&] { result.append(replacement); });
  return result;
}

std::string KXCRegExpPerl::removeAllMatches(std::string_view subject) {
  return replaceAllMatches(subject, "");
}

std::vector<std::string> KXCRegExpPerl::allMatchesForString(std::string_view subject) {
  std::vector<std::string> result;
  if (!search(subject, 0, false)) return result;
  for (std::size_t i = 0; i < static_cast<std::size_t>(compiled_->numGroups); ++i) {
    const std::string_view text =
        kxc_internal::bytesInRange(subject, resultVector_[i * 2], resultVector_[i * 2 + 1]);
    // \C can cut a character in two; such a text is left out.
    if (kxa_isValidUTF8(text)) result.emplace_back(text);
  }
  return result;
}

std::vector<KXCRegExpPatternMatch> KXCRegExpPerl::allMatchesForString(std::string_view subject,
                                                                      std::int64_t substringIndex) {
  std::vector<KXCRegExpPatternMatch> result;
  if (substringIndex < 0 || substringIndex >= compiled_->numGroups) return result;
  const auto group = static_cast<std::size_t>(substringIndex);
  scan(
      subject, [](std::size_t, std::size_t) {},
      [&] {
        const std::string_view text =
            kxc_internal::bytesInRange(subject, resultVector_[0], resultVector_[1]);
        if (!kxa_isValidUTF8(text)) return;
        const int start = resultVector_[group * 2];
        result.emplace_back(std::string(text), start, resultVector_[group * 2 + 1] - start);
      });
  return result;
}

std::optional<KXCRegExpPerlMatch> KXCRegExpPerl::matchForString(std::string_view subject) {
  if (!search(subject, 0, false)) return std::nullopt;
  return KXCRegExpPerlMatch(std::make_shared<const std::string>(subject), compiled_->numGroups,
                            resultVector_);
}

std::vector<KXCRegExpPerlMatch> KXCRegExpPerl::matchesArrayForString(std::string_view subject) {
  std::vector<KXCRegExpPerlMatch> result;
  std::shared_ptr<const std::string> content;  // one copy, shared by every match
  scan(
      subject, [](std::size_t, std::size_t) {},
      [&] {
        if (!content) content = std::make_shared<const std::string>(subject);
        result.emplace_back(content, compiled_->numGroups, resultVector_);
      });
  return result;
}
