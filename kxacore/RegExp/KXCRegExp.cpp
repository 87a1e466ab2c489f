#include "kxacore/RegExp/KXCRegExp.h"

#include <regex.h>

#include <algorithm>
#include <limits>
#include <utility>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/RegExp/KXCRegExpInternal.h"

static_assert(KXCRegExp::kExtended == REG_EXTENDED);
static_assert(KXCRegExp::kCaseless == REG_ICASE);
static_assert(KXCRegExp::kNewline == REG_NEWLINE);

namespace {

// regoff_t is an int on glibc: longer subjects cannot be described.
constexpr std::size_t kMaxSubject = static_cast<std::size_t>(std::numeric_limits<regoff_t>::max());

// regexec reads the subject through a pointer even for an empty range.
const char* bytesOf(std::string_view text) { return text.data() ? text.data() : ""; }

std::optional<std::string> errorString(int code, const regex_t* regExp) {
  const std::size_t size = regerror(code, regExp, nullptr, 0);
  if (size == 0) return std::nullopt;
  std::string message(size, '\0');
  if (regerror(code, regExp, message.data(), message.size()) != size) return std::nullopt;
  message.pop_back();  // the terminating NUL
  return message;
}

}  // namespace

struct KXCRegExp::Compiled {
  regex_t regExp{};
  bool compiled = false;  // regfree is only defined after a successful regcomp
  Compiled() = default;
  Compiled(const Compiled&) = delete;
  Compiled& operator=(const Compiled&) = delete;
  ~Compiled() {
    if (compiled) regfree(&regExp);
  }
};

// ---------------------------------------------------------------------------
// KXCRegExpMatch

KXCRegExpMatch::KXCRegExpMatch(std::shared_ptr<const std::string> content, std::int64_t numGroups,
                               std::span<const std::int64_t> matches)
    : content_(std::move(content)),
      numGroups_(std::max<std::int64_t>(numGroups, 0)),
      matches_(static_cast<std::size_t>(numGroups_) * 2, -1) {
  std::copy_n(matches.begin(), std::min(matches.size(), matches_.size()), matches_.begin());
}

const std::string& KXCRegExpMatch::content() const {
  static const std::string& empty = *new std::string();
  return content_ ? *content_ : empty;
}

std::optional<std::string> KXCRegExpMatch::stringForMatchAtIndex(std::int64_t index) const {
  if (index < 0 || index >= numGroups_) return std::nullopt;
  const std::int64_t start = matches_[static_cast<std::size_t>(index) * 2];
  const std::int64_t end = matches_[static_cast<std::size_t>(index) * 2 + 1];
  return kxc_internal::decodedText(kxc_internal::bytesInRange(content(), start, end));
}

// ---------------------------------------------------------------------------
// KXCRegExp

KXCRegExp::KXCRegExp(std::string pattern, int options, std::unique_ptr<Compiled> compiled)
    : pattern_(std::move(pattern)), options_(options), compiled_(std::move(compiled)) {}

KXCRegExp::~KXCRegExp() = default;

std::unique_ptr<KXCRegExp> KXCRegExp::regExpWithPattern(std::string_view pattern, int options,
                                                        std::string* error) {
  options = (options | REG_EXTENDED) & ~REG_NOSUB;
  std::string copy(pattern);
  if (copy.find('\0') != std::string::npos) {
    if (error) *error = "pattern contains a NUL byte";
    return nullptr;
  }
  auto compiled = std::make_unique<Compiled>();
  if (const int code = regcomp(&compiled->regExp, copy.c_str(), options); code != 0) {
    if (error) *error = errorString(code, &compiled->regExp).value_or("unknown error");
    return nullptr;
  }
  compiled->compiled = true;
  // make_unique cannot reach the private constructor.
  return std::unique_ptr<KXCRegExp>(new KXCRegExp(std::move(copy), options, std::move(compiled)));
}

std::int64_t KXCRegExp::numGroups() const {
  return static_cast<std::int64_t>(compiled_->regExp.re_nsub) + 1;
}

bool KXCRegExp::matchesString(std::string_view subject) const {
  if (subject.size() > kMaxSubject) return false;
  regmatch_t pair{0, static_cast<regoff_t>(subject.size())};
  return regexec(&compiled_->regExp, bytesOf(subject), 1, &pair, REG_STARTEND) == 0;
}

bool KXCRegExp::matchesFullString(std::string_view subject) const {
  if (subject.size() > kMaxSubject) return false;
  regmatch_t pair{0, static_cast<regoff_t>(subject.size())};
  return regexec(&compiled_->regExp, bytesOf(subject), 1, &pair, REG_STARTEND) == 0 &&
         pair.rm_so == 0 && static_cast<std::size_t>(pair.rm_eo) == subject.size();
}

template <class Unmatched, class Matched>
void KXCRegExp::scan(std::string_view subject, Unmatched&& unmatched, Matched&& matched) const {
  if (subject.empty()) return;
  if (subject.size() > kMaxSubject) {
    unmatched(std::size_t{0}, subject.size());
    return;
  }
  const std::size_t count = compiled_->regExp.re_nsub + 1;
  std::vector<regmatch_t> pairs(count);
  std::vector<std::int64_t> offsets(count * 2);
  std::size_t pos = 0;         // where the next search starts
  std::size_t pieceStart = 0;  // start of the pending unmatched piece
  while (pos < subject.size()) {
    // glibc's "^" does not match at a REG_STARTEND offset above 0, so the
    // search starts at the text itself and the offsets are shifted back.
    pairs[0] = {0, static_cast<regoff_t>(subject.size() - pos)};
    if (regexec(&compiled_->regExp, subject.data() + pos, count, pairs.data(), REG_STARTEND) != 0) {
      break;
    }
    for (std::size_t i = 0; i < count; ++i) {
      const bool took = pairs[i].rm_so >= 0;
      offsets[i * 2] = took ? static_cast<std::int64_t>(pos) + pairs[i].rm_so : -1;
      offsets[i * 2 + 1] = took ? static_cast<std::int64_t>(pos) + pairs[i].rm_eo : -1;
    }
    const auto matchStart = static_cast<std::size_t>(offsets[0]);
    const auto matchEnd = static_cast<std::size_t>(offsets[1]);
    if (matchStart != pieceStart) unmatched(pieceStart, matchStart);
    matched(std::span<const std::int64_t>(offsets));
    pieceStart = matchEnd;
    // An empty match would be found again at the same place forever.
    pos = matchEnd != matchStart ? matchEnd : kxc_internal::nextCharacter(subject, matchEnd);
  }
  if (pieceStart < subject.size()) unmatched(pieceStart, subject.size());
}

std::string KXCRegExp::replaceAllMatches(std::string_view subject,
                                         std::string_view replacement) const {
  std::string result;
  scan(
      subject,
      [&](std::size_t begin, std::size_t end) { result.append(subject, begin, end - begin); },
      [&](std::span<const std::int64_t>) { result.append(replacement); });
  return result;
}

std::string KXCRegExp::removeAllMatches(std::string_view subject) const {
  return replaceAllMatches(subject, "");
}

void KXCRegExp::enumerateAllMatches(std::string_view subject, const PieceBlock& block) const {
  scan(
      subject,
      [&](std::size_t begin, std::size_t end) { block(false, subject.substr(begin, end - begin)); },
      [&](std::span<const std::int64_t> offsets) {
        block(true, kxc_internal::bytesInRange(subject, offsets[0], offsets[1]));
      });
}

std::string KXCRegExp::replaceAllMatchesWithStringEvaluator(
    std::string_view subject, const StringEvaluator& evaluator) const {
  std::string result;
  scan(
      subject,
      [&](std::size_t begin, std::size_t end) { result.append(subject, begin, end - begin); },
      [&](std::span<const std::int64_t> offsets) {
        if (auto replacement =
                evaluator(kxc_internal::bytesInRange(subject, offsets[0], offsets[1]))) {
          result.append(*replacement);
        }
      });
  return result;
}

std::string KXCRegExp::replaceAllMatchesWithMatchEvaluator(std::string_view subject,
                                                           const MatchEvaluator& evaluator) const {
  std::string result;
  std::shared_ptr<const std::string> content;  // one copy, made at the first match
  scan(
      subject,
      [&](std::size_t begin, std::size_t end) { result.append(subject, begin, end - begin); },
      [&](std::span<const std::int64_t> offsets) {
        if (!content) content = std::make_shared<const std::string>(subject);
        result.append(evaluator(
            KXCRegExpMatch(content, static_cast<std::int64_t>(offsets.size() / 2), offsets)));
      });
  return result;
}

std::vector<std::string> KXCRegExp::allMatchesForString(std::string_view subject) const {
  std::vector<std::string> result;
  scan(
      subject, [](std::size_t, std::size_t) {},
      [&](std::span<const std::int64_t> offsets) {
        result.emplace_back(kxc_internal::bytesInRange(subject, offsets[0], offsets[1]));
      });
  return result;
}

std::vector<KXCRegExpPatternMatch> KXCRegExp::allMatchesForString(std::string_view subject,
                                                                  std::int64_t) const {
  std::vector<KXCRegExpPatternMatch> result;
  // UTF-16 count of the bytes before the previous match, so that the start of
  // each match costs only the bytes since then.
  std::size_t countedBytes = 0;
  std::size_t countedUnits = 0;
  scan(
      subject, [](std::size_t, std::size_t) {},
      [&](std::span<const std::int64_t> offsets) {
        const std::string_view text = kxc_internal::bytesInRange(subject, offsets[0], offsets[1]);
        const auto start = static_cast<std::size_t>(offsets[0]);
        countedUnits += kxa_utf16Length(subject.substr(countedBytes, start - countedBytes));
        countedBytes = start;
        if (!kxa_isValidUTF8(text)) return;
        result.emplace_back(std::string(text), static_cast<std::int64_t>(countedUnits),
                            static_cast<std::int64_t>(kxa_utf16Length(text)));
      });
  return result;
}
