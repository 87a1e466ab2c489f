#include "kxacore/Data/Places/KXDPlaceName.h"

#include <bit>
#include <charconv>
#include <cmath>
#include <limits>
#include <system_error>

#include "kxacore/Data/Places/KXDPlaceNameFormatInfo.h"
#include "kxacore/Extensions/KXAStringExtensions.h"

static_assert(KXDPlaceName::kCoordinateEpsilon == std::numeric_limits<float>::epsilon());
// Decoded coordinates rely on IEEE conversion: out-of-range doubles become
// infinities rather than undefined values.
static_assert(std::numeric_limits<float>::is_iec559 && std::numeric_limits<double>::is_iec559);

namespace {

// Reads record data the way the desktop platform's string scanner did:
// white space and line breaks before every token are skipped, and a scan
// that fails leaves the position where it was.
class RecordScanner {
 public:
  explicit RecordScanner(std::string_view text) noexcept : text_(text) {}

  bool scanString(std::string_view literal) noexcept {
    const std::size_t pos = skipped();
    if (!text_.substr(pos).starts_with(literal)) return false;
    pos_ = pos + literal.size();
    return true;
  }

  // The text up to `stop` or to the end; nullopt when that would be empty.
  std::optional<std::string_view> scanUpTo(char stop) noexcept {
    const std::size_t pos = skipped();
    std::size_t end = text_.find(stop, pos);
    if (end == std::string_view::npos) end = text_.size();
    if (end == pos) return std::nullopt;
    pos_ = end;
    return text_.substr(pos, end - pos);
  }

  // separator code "/" lat "/" lon, ending the record. A missing number is
  // fine as long as the separator after it is there; the longitude may be
  // missing at the very end.
  bool scanNumbers(std::string_view separator, std::int64_t& code, float& latitude,
                   float& longitude) noexcept {
    if (!scanString(separator)) return false;
    static_cast<void>(scanInteger(code));
    if (!scanString("/")) return false;
    static_cast<void>(scanFloat(latitude));
    if (!scanString("/")) return false;
    static_cast<void>(scanFloat(longitude));
    return isAtEnd();
  }

  bool scanInteger(std::int64_t& value) noexcept {
    const std::size_t pos = skipped();
    KXAScanner integer(text_.substr(pos));
    if (!integer.scanInteger(value)) return false;
    pos_ = pos + integer.scanLocation();
    return true;
  }

  // A decimal number: optional sign, digits with an optional point (at least
  // one digit), optional exponent. No hexadecimal, infinity or NaN spellings.
  // Overflow gives an infinity and underflow zero, as the platform's scanner did.
  bool scanFloat(float& value) noexcept {
    std::size_t pos = skipped();
    bool negative = false;
    if (pos < text_.size() && (text_[pos] == '+' || text_[pos] == '-')) {
      negative = text_[pos] == '-';
      ++pos;
    }
    const std::size_t mantissa = pos;
    std::size_t digits = 0;
    // The value is 0.ddd times ten to the power (magnitude + exponent).
    std::int64_t magnitude = 0;
    bool significant = false;
    bool point = false;
    for (; pos < text_.size(); ++pos) {
      const char c = text_[pos];
      if (c == '.' && !point) {
        point = true;
        continue;
      }
      if (c < '0' || c > '9') break;
      ++digits;
      if (c != '0') significant = true;
      if (significant && !point) ++magnitude;
      if (!significant && point) --magnitude;
    }
    if (digits == 0) return false;
    std::int64_t exponent = 0;
    if (pos < text_.size() && (text_[pos] == 'e' || text_[pos] == 'E')) {
      // Taken only with digits right after it: "1e" leaves the "e" for the caller.
      std::size_t e = pos + 1;
      const bool minus = e < text_.size() && text_[e] == '-';
      if (e < text_.size() && (text_[e] == '+' || text_[e] == '-')) ++e;
      if (e < text_.size() && text_[e] >= '0' && text_[e] <= '9') {
        for (; e < text_.size() && text_[e] >= '0' && text_[e] <= '9'; ++e) {
          // Clamped far beyond any double; only the sign of the sum matters then.
          if (exponent < 1000000) exponent = exponent * 10 + (text_[e] - '0');
        }
        if (minus) exponent = -exponent;
        pos = e;
      }
    }
    double number = 0;
    const char* first = text_.data() + mantissa;
    const char* last = text_.data() + pos;
    const auto [end, error] = std::from_chars(first, last, number, std::chars_format::general);
    if (error == std::errc::result_out_of_range) {
      // from_chars leaves the value alone here.
      number = significant && magnitude + exponent > 0 ? std::numeric_limits<double>::infinity()
                                                         : 0.0;
    } else if (error != std::errc() || end != last) {
      return false;
    }
    value = static_cast<float>(negative ? -number : number);
    pos_ = pos;
    return true;
  }

  bool isAtEnd() const noexcept { return skipped() >= text_.size(); }

 private:
  std::size_t skipped() const noexcept {
    std::size_t pos = pos_;
    std::size_t length = 0;
    while (kxa_isSpaceAt(text_, pos, length)) pos += length;
    return pos;
  }

  std::string_view text_;
  std::size_t pos_ = 0;
};

// Stores a field read from a record, trimmed. A field empty between its
// separators is never read, so it keeps whatever it held.
void store(std::optional<std::string_view> field, std::optional<std::string>& into) {
  if (field) into.emplace(kxa_trim(*field));
}

void appendInteger(std::string& out, std::int64_t value) {
  char buffer[24];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
  out.append(buffer, result.ptr);
}

// "%.10f" of the value widened to double, locale-independent.
void appendCoordinate(std::string& out, float value) {
  char buffer[64];
  const auto result = std::to_chars(buffer, buffer + sizeof buffer, static_cast<double>(value),
                                    std::chars_format::fixed, 10);
  if (result.ec == std::errc()) {
    out.append(buffer, result.ptr);
    return;
  }
  // Magnitudes near FLT_MAX print 39 integer digits: still fits, but be safe.
  char large[400];
  const auto wide = std::to_chars(large, large + sizeof large, static_cast<double>(value),
                                  std::chars_format::fixed, 10);
  out.append(large, wide.ptr);
}

void appendField(std::string& out, const std::optional<std::string>& field) {
  if (field) out += *field;
}

bool nonEmpty(const std::optional<std::string>& field) { return field && !field->empty(); }

std::string quoted(const std::optional<std::string>& field) {
  return field ? "\"" + *field + "\"" : std::string("(absent)");
}

std::size_t mix(std::size_t seed, std::size_t value) noexcept {
  // boost::hash_combine's mixing step, widened to 64 bits.
  return seed ^ (value + 0x9e3779b97f4a7c15ULL + (seed << 12) + (seed >> 4));
}

std::size_t hashField(const std::optional<std::string>& field) noexcept {
  // Absent and "" must differ, as they do for operator==.
  return field ? std::hash<std::string_view>{}(*field) ^ 0x5bd1e995ULL : 0x2545f491ULL;
}

std::size_t hashCoordinate(float value) noexcept {
  // -0 equals +0, so both hash as +0. NaN equals nothing: any hash will do.
  if (value == 0.0f) value = 0.0f;
  return std::bit_cast<std::uint32_t>(value);
}

}  // namespace

KXDPlaceName KXDPlaceName::placeNameWithRecordData(std::string_view record) {
  KXDPlaceName place;
  place.record_.emplace(record);
  static_cast<void>(place.decode(record));
  return place;
}

KXDPlaceName KXDPlaceName::placeNameWithGeo1(std::optional<std::string> geo1,
                                             std::optional<std::string> geo2,
                                             std::optional<std::string> geo3,
                                             std::optional<std::string> geo4,
                                             std::optional<std::string> country,
                                             std::int64_t code, float latitude,
                                             float longitude) {
  KXDPlaceName place;
  place.geo1_ = std::move(geo1);
  place.geo2_ = std::move(geo2);
  place.geo3_ = std::move(geo3);
  place.geo4_ = std::move(geo4);
  place.country_ = std::move(country);
  place.code_ = code;
  place.latitude_ = latitude;
  place.longitude_ = longitude;
  return place;
}

KXDPlaceName KXDPlaceName::placeNameWithText(std::optional<std::string> text,
                                             std::int64_t code, float latitude,
                                             float longitude) {
  KXDPlaceName place;
  place.rawText_ = std::move(text);
  place.code_ = code;
  place.latitude_ = latitude;
  place.longitude_ = longitude;
  return place;
}

KXDPlaceName KXDPlaceName::placeNameWithPlaceName(const KXDPlaceName& place, float latitude,
                                                  float longitude, std::int64_t code) {
  KXDPlaceName copy = place;
  copy.record_.reset();
  copy.latitude_ = latitude;
  copy.longitude_ = longitude;
  copy.code_ = code;
  return copy;
}

bool KXDPlaceName::hasCoordinate(float value) noexcept {
  return std::fabs(value) >= kCoordinateEpsilon;  // false for NaN
}

bool KXDPlaceName::decode(std::string_view record) {
  if (decodeStructured(record)) return true;
  if (decodeFreeText(record)) return true;
  if (record.starts_with('/')) record.remove_prefix(1);
  rawText_.emplace(kxa_trim(record));
  return false;
}

// "/" geo4 "/" geo3 "/" geo2 "/" geo1 "/" country "/" code "/" lat "/" lon.
// Fields are stored as they are read, so a failure keeps the ones before it.
bool KXDPlaceName::decodeStructured(std::string_view record) {
  RecordScanner scanner(record);
  if (!scanner.scanString("/")) return false;
  std::optional<std::string>* const levels[] = {&geo4_, &geo3_, &geo2_, &geo1_, &country_};
  bool first = true;
  for (std::optional<std::string>* level : levels) {
    if (!first && !scanner.scanString("/")) return false;
    first = false;
    store(scanner.scanUpTo('/'), *level);
  }
  return scanner.scanNumbers("/", code_, latitude_, longitude_);
}

// "/" rawText "|" code "/" lat "/" lon, read from the start of the record.
bool KXDPlaceName::decodeFreeText(std::string_view record) {
  RecordScanner scanner(record);
  if (!scanner.scanString("/")) return false;
  store(scanner.scanUpTo('|'), rawText_);
  return scanner.scanNumbers("|", code_, latitude_, longitude_);
}

std::string KXDPlaceName::encode() const {
  std::string out;
  out.reserve(64);
  out += '/';
  if (nonEmpty(rawText_)) {
    out += *rawText_;
    out += '|';
  } else {
    appendField(out, geo4_);
    out += '/';
    appendField(out, geo3_);
    out += '/';
    appendField(out, geo2_);
    out += '/';
    appendField(out, geo1_);
    out += '/';
    appendField(out, country_);
    out += '/';
  }
  if (code_ != 0) appendInteger(out, code_);
  out += '/';
  if (hasCoordinate(latitude_)) appendCoordinate(out, latitude_);
  out += '/';
  if (hasCoordinate(longitude_)) appendCoordinate(out, longitude_);
  return out;
}

std::string KXDPlaceName::recordData() const { return record_ ? *record_ : encode(); }

std::array<std::string, 5> KXDPlaceName::nameParts() const {
  return {country_.value_or(""), geo1_.value_or(""), geo2_.value_or(""), geo3_.value_or(""),
          geo4_.value_or("")};
}

void KXDPlaceName::setFromNameParts(std::span<const std::string> parts) {
  record_.reset();
  std::optional<std::string>* const fields[] = {&country_, &geo1_, &geo2_, &geo3_, &geo4_};
  for (std::size_t i = 0; i < parts.size() && i < std::size(fields); ++i) {
    if (!parts[i].empty()) *fields[i] = parts[i];
  }
}

void KXDPlaceName::setFromNameParts(std::initializer_list<std::string_view> parts) {
  record_.reset();
  std::optional<std::string>* const fields[] = {&country_, &geo1_, &geo2_, &geo3_, &geo4_};
  std::size_t i = 0;
  for (std::string_view part : parts) {
    if (i == std::size(fields)) break;
    if (!part.empty()) fields[i]->emplace(part);
    ++i;
  }
}

std::string KXDPlaceName::description() const {
  std::string out = "KXDPlaceName {rawText: " + quoted(rawText_);
  out += ", geo4: " + quoted(geo4_);
  out += ", geo3: " + quoted(geo3_);
  out += ", geo2: " + quoted(geo2_);
  out += ", geo1: " + quoted(geo1_);
  out += ", country: " + quoted(country_);
  out += ", code: ";
  appendInteger(out, code_);
  out += ", latitude: ";
  appendCoordinate(out, latitude_);
  out += ", longitude: ";
  appendCoordinate(out, longitude_);
  out += ", record: " + quoted(record_) + "}";
  return out;
}

KXDPlaceNameFormatInfo& KXDPlaceName::formatter() {
  // The shared instance is never released, so a reference is safe and
  // spares every call the shared_ptr's atomic counting.
  static KXDPlaceNameFormatInfo& shared = *KXDPlaceNameFormatInfo::defaultFormatter();
  return shared;
}

std::string KXDPlaceName::stringWithFormat(std::optional<std::string_view> format,
                                           KXDFormatInfo* provider) const {
  return formatter().stringForObject(*this, format, provider).value_or(std::string());
}

std::string KXDPlaceName::stringWithGeneralFormat() const {
  return stringWithFormat(std::nullopt, nullptr);
}

std::string KXDPlaceName::stringWithGeneralFormatWithCountry() const {
  return stringWithFormat(kKXDPlaceNameFormatGeneralWithCountry, nullptr);
}

std::string KXDPlaceName::stringWithFormat(std::string_view format) const {
  return stringWithFormat(std::optional<std::string_view>(format), nullptr);
}

std::string KXDPlaceName::stringWithFormatInfo(KXDFormatInfo* provider) const {
  return stringWithFormat(std::nullopt, provider);
}

bool operator==(const KXDPlaceName& a, const KXDPlaceName& b) noexcept {
  return a.code_ == b.code_ && a.latitude_ == b.latitude_ && a.longitude_ == b.longitude_ &&
         a.country_ == b.country_ && a.geo1_ == b.geo1_ && a.geo2_ == b.geo2_ &&
         a.geo3_ == b.geo3_ && a.geo4_ == b.geo4_ && a.rawText_ == b.rawText_;
}

std::size_t KXDPlaceName::hash() const noexcept {
  std::size_t seed = std::hash<std::int64_t>{}(code_);
  seed = mix(seed, hashCoordinate(latitude_));
  seed = mix(seed, hashCoordinate(longitude_));
  for (const auto* field : {&country_, &geo1_, &geo2_, &geo3_, &geo4_, &rawText_}) {
    seed = mix(seed, hashField(*field));
  }
  return seed;
}
