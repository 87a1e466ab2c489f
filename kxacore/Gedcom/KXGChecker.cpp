#include "kxacore/Gedcom/KXGChecker.h"

#include <algorithm>
#include <array>
#include <bit>
#include <limits>
#include <optional>
#include <unordered_map>
#include <unordered_set>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/Data/Names/KXDNameParser.h"
#include "kxacore/Data/Places/KXDPlaceName.h"
#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Gedcom/KXGDateReader.h"
#include "kxacore/Gedcom/KXGIdTable.h"

namespace {

constexpr std::uint32_t kNone = std::numeric_limits<std::uint32_t>::max();
constexpr std::size_t kValueCacheCapacity = 65536;
constexpr double kDaysPerYear = 365.2425;

enum class Kind : std::uint8_t { kUndefined, kIndividual, kFamily, kOther };

struct TransparentHash {
  using is_transparent = void;
  // Deliberately not noexcept: the standard library then stores each key's
  // hash, so a lookup does not hash every key of the bucket it walks.
  std::size_t operator()(std::string_view text) const {
    return std::hash<std::string_view>{}(text);
  }
};
template <typename V>
using StringMap = std::unordered_map<std::string, V, TransparentHash, std::equal_to<>>;

// One dated event, as the consistency checks need it. Compact: millions of
// them are kept. Day numbers and the open-end sentinels fit 32 bits.
struct EventSpan {
  std::int32_t earliest = 0;
  std::int32_t latest = 0;
  std::uint32_t line = 0;      // saturated beyond 2^32 - 1
  std::uint32_t text = kNone;  // index of the date as written; kNone: no date
  [[nodiscard]] bool known() const noexcept { return text != kNone; }
};

// The events kept per individual, in the order they are stored.
enum Event : unsigned { kBirth, kBaptism, kDeath, kBurial, kEventCount };

// Most individuals have one or two dated events of four, so only the known
// ones are stored, one record's after the other in a shared list.
struct Individual {
  std::uint32_t id = kNone;
  std::uint32_t firstEvent = 0;  // into the event list
  std::uint8_t events = 0;       // bit per Event that is known
};

struct Family {
  std::uint32_t id = kNone;
  std::uint32_t husband = kNone;  // id indices
  std::uint32_t wife = kNone;
  std::uint32_t marriage = kNone;  // into the event list
};

struct IdEntry {
  std::uint32_t line = 0;       // saturated beyond 2^32 - 1
  std::uint32_t index = kNone;  // into individuals or families
  Kind kind = Kind::kUndefined;
  std::uint8_t tag = 0;         // the record's tag, for messages (interned)
};

// A pointer whose target was not yet defined when it was read.
struct PendingPointer {
  std::uint32_t target = 0;
  std::uint32_t line = 0;  // saturated beyond 2^32 - 1
  std::uint16_t tag = 0;
};

// One side of an individual-family link. Packed: there are about two per
// record, and 13 bytes instead of 16 is 6 bytes a record.
struct [[gnu::packed]] Link {
  std::uint32_t family = 0;  // id indices
  std::uint32_t individual = 0;
  std::uint32_t line = 0;    // saturated beyond 2^32 - 1
  bool child : 1 = false;       // FAMC or CHIL, else a spouse
  bool fromFamily : 1 = false;  // HUSB, WIFE or CHIL
  bool paired : 1 = false;      // the other side exists (set at the end)
};

std::uint32_t compactLine(std::uint64_t line) {
  return static_cast<std::uint32_t>(std::min<std::uint64_t>(line, std::numeric_limits<std::uint32_t>::max()));
}

bool isPointer(std::string_view value) {
  return value.size() >= 3 && value.front() == '@' && value.back() == '@' && value[1] != '#' &&
         value.find(' ') == std::string_view::npos;
}

// The kind a pointer of `tag` must lead to, or kUndefined when any kind will do.
Kind expectedKind(std::string_view tag) {
  if (tag == "FAMS" || tag == "FAMC") return Kind::kFamily;
  if (tag == "HUSB" || tag == "WIFE" || tag == "CHIL" || tag == "ALIA" || tag == "ASSO") {
    return Kind::kIndividual;
  }
  return Kind::kUndefined;
}

bool isLdsOrdinance(std::string_view tag) {
  return tag == "BAPL" || tag == "CONL" || tag == "ENDL" || tag == "SLGC" || tag == "SLGS" ||
         tag == "WAC";
}

std::string dayText(std::int64_t sdn) {
  static constexpr std::array<std::string_view, 12> kMonths = {
      "Jan", "Feb", "Mar", "Apr", "May", "Jun", "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const KXDCalendarDate day = KXDDate::gregorianDateFromSdn(sdn);
  if (!day.ok()) return "?";
  const std::string year =
      day.year < 0 ? std::to_string(-day.year) + " BC" : std::to_string(day.year);
  return std::to_string(day.day) + " " + std::string(kMonths[static_cast<std::size_t>(day.month - 1)]) +
         " " + year;
}

// "1850", "Mar 1850", "12 Mar 1850", "before 1850", "between ... and ...".
std::string spanText(const EventSpan& span) {
  const bool openStart = span.earliest <= KXGDateReading::kOpenStart;
  const bool openEnd = span.latest >= KXGDateReading::kOpenEnd;
  if (openStart && openEnd) return "?";
  if (openStart) return "before " + dayText(span.latest + 1);
  if (openEnd) return "after " + dayText(span.earliest - 1);
  if (span.earliest == span.latest) return dayText(span.earliest);
  const KXDCalendarDate first = KXDDate::gregorianDateFromSdn(span.earliest);
  const KXDCalendarDate last = KXDDate::gregorianDateFromSdn(span.latest);
  if (first.ok() && last.ok() && first.year == last.year && first.day == 1) {
    const std::string text = dayText(span.earliest);
    if (first.month == 1 && last.month == 12 && last.day == 31) return text.substr(text.find(' ', 3) + 1);
    if (first.month == last.month && KXDDate::gregorianDateFromSdn(span.latest + 1).day == 1) {
      return text.substr(text.find(' ') + 1);
    }
  }
  return "between " + dayText(span.earliest) + " and " + dayText(span.latest);
}

std::int64_t years(std::int64_t days) {
  return static_cast<std::int64_t>(static_cast<double>(days) / kDaysPerYear);
}

std::int64_t yearsInDays(int years) {
  return static_cast<std::int64_t>(years * kDaysPerYear);
}

}  // namespace

bool KXGCheckOptions::reports(const KXGFinding& finding) const {
  if (finding.severity > minimumSeverity) return false;
  if (!selectedCodes.empty() && !selectedCodes.contains(finding.code)) return false;
  return !ignoredCodes.contains(finding.code);
}

void KXGCheckerDelegate::checkerDidFindProblem(KXGChecker&, const KXGFinding&) {}

struct KXGChecker::Impl final : KXGReaderDelegate {
  Impl(KXGChecker& owner, KXGCheckOptions options, KXGCheckerDelegate* delegate)
      : owner(owner), options(std::move(options)), delegate(delegate), reader(this) {}

  KXGChecker& owner;
  KXGCheckOptions options;
  KXGCheckerDelegate* delegate;
  KXGReader reader;
  KXGSummary summary;
  KXGDateReader dates;
  KXDNameParser nameParser;
  StringMap<std::uint8_t> nameCache;   // bit 1: empty
  StringMap<std::uint8_t> placeCache;  // bit 1: unstorable, 2: more than five levels

  KXGIdTable idTable;
  KXGChunkedVector<IdEntry> ids;
  KXGChunkedVector<Individual> individuals;
  KXGChunkedVector<Family> families;
  KXGChunkedVector<EventSpan> events;
  std::vector<PendingPointer> pending;
  std::size_t pendingAfterPrune = 0;
  KXGChunkedVector<Link> links;
  // The dated events of the record being read (a family's marriage is the
  // first), stored when the record ends.
  std::array<EventSpan, kEventCount> recordEvents{};
  std::uint8_t recordEventMask = 0;
  std::vector<std::string> tags;  // interned tags of pending pointers
  std::vector<std::string> recordTags;  // at most 256; the last stands for the rest
  // Dates of events as written, for messages; events share equal texts.
  StringMap<std::uint32_t> dateTextIndex;
  std::vector<std::string_view> dateTexts;

  std::uint32_t internDateText(std::string_view text) {
    text = kxa_trim(text);
    if (const auto found = dateTextIndex.find(text); found != dateTextIndex.end()) return found->second;
    const auto index = static_cast<std::uint32_t>(dateTexts.size());
    dateTexts.push_back(dateTextIndex.emplace(std::string(text), index).first->first);
    return index;
  }

  std::string eventText(const EventSpan& span) const {
    return span.text < dateTexts.size() ? std::string(dateTexts[span.text]) : spanText(span);
  }

  bool sawHeader = false;
  bool sawTrailer = false;
  bool reportedAfterTrailer = false;
  bool finished = false;

  // ---- Findings ----------------------------------------------------------

  void emit(KXGFinding finding) {
    if (!options.reports(finding)) return;
    summary.countFinding(finding);
    if (delegate != nullptr) delegate->checkerDidFindProblem(owner, finding);
  }

  void emit(std::uint64_t line, std::string_view code, std::string message, std::string_view tag,
            std::string_view value) {
    const KXGCheckCodeInfo* info = KXGCheckCodeInfoForCode(code);
    emit(KXGFinding{line, info ? info->severity : KXGSeverity::kError, std::string(code),
                    std::move(message), std::string(tag), std::string(value)});
  }

  void readerDidFindProblem(KXGReader&, const KXGFinding& finding) override { emit(finding); }

  // ---- Ids ---------------------------------------------------------------

  std::uint32_t internId(std::string_view id) {
    const auto [index, added] = idTable.intern(id);
    if (added) ids.push_back({});
    return index;
  }

  std::uint8_t internTag(std::string_view tag) {
    const auto found = std::find(recordTags.begin(), recordTags.end(), tag);
    if (found != recordTags.end()) return static_cast<std::uint8_t>(found - recordTags.begin());
    if (recordTags.size() == 255) recordTags.emplace_back("other");
    if (recordTags.size() >= 256) return 255;
    recordTags.emplace_back(tag);
    return static_cast<std::uint8_t>(recordTags.size() - 1);
  }

  std::string tagName(std::uint8_t tag) const {
    return tag < recordTags.size() ? recordTags[tag] : std::string("?");
  }

  // ---- Records -----------------------------------------------------------

  void readerDidReadRecord(KXGReader&, const KXGRecord& record) override {
    ++summary.records;
    const KXGLine& root = record.root();
    if (!sawHeader && summary.records == 1) {
      sawHeader = root.tag == "HEAD";
      if (!sawHeader) {
        emit(root.number, "header-missing", "The file does not start with a 0 HEAD record.",
             root.tag, root.value);
      } else {
        checkHeader(record);
      }
    }
    if (sawTrailer && !reportedAfterTrailer) {
      reportedAfterTrailer = true;
      emit(root.number, "after-trailer", "Records follow the end of the file (0 TRLR).", root.tag,
           root.xref);
    }
    if (root.tag == "TRLR") sawTrailer = true;

    std::uint32_t self = kNone;
    Kind kind = Kind::kOther;
    if (root.tag == "INDI") {
      ++summary.individuals;
      kind = Kind::kIndividual;
    } else if (root.tag == "FAM") {
      ++summary.families;
      kind = Kind::kFamily;
    }
    if (!root.xref.empty()) {
      self = internId(root.xref);
      IdEntry& entry = ids[self];
      const bool duplicate = entry.kind != Kind::kUndefined;
      if (duplicate) {
        emit(root.number, "id-duplicate",
             "The id " + root.xref + " is already used by the " + tagName(entry.tag) +
                 " record on line " + std::to_string(entry.line) + ".",
             root.tag, root.xref);
      } else {
        entry.kind = kind;
        entry.line = compactLine(root.number);
        entry.tag = internTag(root.tag);
        if (kind == Kind::kIndividual) {
          entry.index = static_cast<std::uint32_t>(individuals.size());
          individuals.push_back({self, 0, 0});
        } else if (kind == Kind::kFamily) {
          entry.index = static_cast<std::uint32_t>(families.size());
          families.push_back({self, kNone, kNone, kNone});
        }
      }
      // A duplicate record is still read for its values, but not linked.
      if (duplicate) self = kNone;
    }

    recordEventMask = 0;
    const std::span<const KXGLine> lines = record.lines();
    for (std::size_t i = 0; i < lines.size(); ++i) {
      const KXGLine& line = lines[i];
      const KXGLine* parent = line.parent >= 0 ? &lines[static_cast<std::size_t>(line.parent)] : nullptr;
      if (line.tag == "DATE") {
        checkDate(line, parent, kind, self);
      } else if (line.tag == "NAME") {
        checkName(line, kind);
      } else if (line.tag == "PLAC") {
        checkPlace(line);
      } else if (i > 0 && isPointer(line.value)) {
        checkPointer(line, kind, self);
      }
    }
    keepRecordEvents(kind, self);
  }

  void keepRecordEvents(Kind kind, std::uint32_t self) {
    if (self == kNone || recordEventMask == 0) return;
    const auto first = static_cast<std::uint32_t>(events.size());
    for (unsigned event = 0; event < kEventCount; ++event) {
      if ((recordEventMask & (1u << event)) != 0) events.push_back(recordEvents[event]);
    }
    if (kind == Kind::kIndividual) {
      Individual& person = individuals[ids[self].index];
      person.firstEvent = first;
      person.events = recordEventMask;
    } else {
      families[ids[self].index].marriage = first;
    }
  }

  EventSpan eventOf(const Individual& person, Event event) const {
    const unsigned bit = 1u << event;
    if ((person.events & bit) == 0) return {};
    return events[person.firstEvent + static_cast<unsigned>(std::popcount(person.events & (bit - 1)))];
  }

  EventSpan marriageOf(const Family& family) const {
    return family.marriage == kNone ? EventSpan{} : events[family.marriage];
  }

  void checkHeader(const KXGRecord& record) {
    const KXGCharacterSet& set = reader.characterSet();
    for (const KXGLine& line : record.lines()) {
      if (line.level != 1 || line.tag != "CHAR") continue;
      const auto declared = KXGEncodingForCharValue(line.value);
      if (!declared) {
        emit(line.number, "charset-unknown",
             "Unknown character set \"" + line.value + "\"; the file is read as " +
                 KXGEncodingDisplayName(reader.encoding()) + ".",
             line.tag, line.value);
        return;
      }
      const bool sixteen = *declared == kKXCUnicodeStringEncoding;
      const KXCStringEncoding actual = set.encoding;
      const bool actualSixteen = actual == kKXCUTF16LittleEndianStringEncoding ||
                                 actual == kKXCUTF16BigEndianStringEncoding;
      if (sixteen != actualSixteen || (set.fromBytes && !sixteen && *declared != actual)) {
        emit(line.number, "charset-mismatch",
             "The header declares " + line.value + ", but the bytes are " +
                 KXGEncodingDisplayName(actual) + "; the file is read as " +
                 KXGEncodingDisplayName(actual) + ".",
             line.tag, line.value);
      }
      return;
    }
    emit(record.root().number, "charset-missing",
         "The header names no character set (1 CHAR); the file is read as " +
             KXGEncodingDisplayName(set.encoding) + ".",
         "HEAD", "");
  }

  void checkDate(const KXGLine& line, const KXGLine* parent, Kind kind, std::uint32_t self) {
    ++summary.dates;
    const bool lds = parent != nullptr && isLdsOrdinance(parent->tag);
    const KXGDateReading& reading = dates.read(line.value, lds);
    for (const KXGDateProblem& problem : reading.problems) {
      emit(KXGFinding{line.number, problem.severity, std::string(problem.code), problem.message,
                      line.tag, line.value});
    }
    if (!reading.hasSpan || self == kNone || parent == nullptr || parent->level != 1) return;
    const auto keep = [&](Event event) {
      if ((recordEventMask & (1u << event)) != 0) return;
      recordEventMask = static_cast<std::uint8_t>(recordEventMask | (1u << event));
      EventSpan& slot = recordEvents[event];
      slot.earliest = static_cast<std::int32_t>(
          std::clamp(reading.earliest, KXGDateReading::kOpenStart, KXGDateReading::kOpenEnd));
      slot.latest = static_cast<std::int32_t>(
          std::clamp(reading.latest, KXGDateReading::kOpenStart, KXGDateReading::kOpenEnd));
      slot.line = compactLine(line.number);
      slot.text = internDateText(line.value);
    };
    const std::string& event = parent->tag;
    if (kind == Kind::kIndividual) {
      if (event == "BIRT") keep(kBirth);
      else if (event == "CHR" || event == "BAPM") keep(kBaptism);
      else if (event == "DEAT") keep(kDeath);
      else if (event == "BURI") keep(kBurial);
    } else if (kind == Kind::kFamily && event == "MARR") {
      keep(kBirth);  // a family's only kept event
    }
  }

  void checkName(const KXGLine& line, Kind kind) {
    ++summary.names;
    std::uint8_t flags = 0;
    if (const auto found = nameCache.find(line.value); found != nameCache.end()) {
      flags = found->second;
    } else {
      const std::int64_t outcome = nameParser.parseName(line.value);
      if ((outcome & kKXDNameEmptyInput) != 0) flags |= 1;
      if (std::count(line.value.begin(), line.value.end(), '/') % 2 != 0) flags |= 2;
      if (nameCache.size() >= kValueCacheCapacity) nameCache.clear();
      nameCache.emplace(line.value, flags);
    }
    // Only personal names are held to the name rules (a header's NAME is a product).
    if (kind != Kind::kIndividual) return;
    if ((flags & 1) != 0) {
      emit(line.number, "name-empty", "The name is empty.", line.tag, line.value);
    } else if ((flags & 2) != 0) {
      emit(line.number, "name-slashes",
           "The slashes around the surname do not pair up: write it as Given /Surname/.",
           line.tag, line.value);
    }
  }

  static std::uint8_t placeFlags(std::string_view value) {
    std::vector<std::string> parts;
    for (const std::string_view part : kxa_split(value, ",")) parts.emplace_back(kxa_trim(part));
    std::uint8_t flags = 0;
    if (parts.size() > 5) {
      // Join the most local levels into one.
      flags |= 2;
      const std::size_t extra = parts.size() - 5;
      for (std::size_t i = 1; i <= extra; ++i) parts[0] += ", " + parts[i];
      parts.erase(parts.begin() + 1, parts.begin() + static_cast<std::ptrdiff_t>(extra) + 1);
    }
    // Most local first, the country last.
    std::array<std::optional<std::string>, 5> levels;  // geo4, geo3, geo2, geo1, country
    const std::size_t offset = 5 - parts.size();
    for (std::size_t i = 0; i < parts.size(); ++i) {
      if (!parts[i].empty()) levels[offset + i] = parts[i];
    }
    const KXDPlaceName place = KXDPlaceName::placeNameWithGeo1(levels[3], levels[2], levels[1],
                                                              levels[0], levels[4], 0, 0, 0);
    if (!(KXDPlaceName::placeNameWithRecordData(place.recordData()) == place)) flags |= 1;
    return flags;
  }

  void checkPlace(const KXGLine& line) {
    ++summary.places;
    if (kxa_trim(line.value).empty()) {
      emit(line.number, "place-empty", "The place is empty.", line.tag, line.value);
      return;
    }
    std::uint8_t flags = 0;
    if (const auto found = placeCache.find(line.value); found != placeCache.end()) {
      flags = found->second;
    } else {
      flags = placeFlags(line.value);
      if (placeCache.size() >= kValueCacheCapacity) placeCache.clear();
      placeCache.emplace(line.value, flags);
    }
    if ((flags & 1) != 0) {
      emit(line.number, "place-unstorable",
           "A level of the place holds / or |, which a place record cannot keep.", line.tag,
           line.value);
    }
    if ((flags & 2) != 0) {
      emit(line.number, "place-levels",
           "The place has more than five levels; the most local ones are kept together.",
           line.tag, line.value);
    }
  }

  void checkPointer(const KXGLine& line, Kind kind, std::uint32_t self) {
    const std::uint32_t target = internId(line.value);
    const IdEntry& entry = ids[target];
    if (entry.kind == Kind::kUndefined) {
      const auto found = std::find(tags.begin(), tags.end(), line.tag);
      const auto tagIndex = static_cast<std::uint16_t>(found - tags.begin());
      if (found == tags.end() && tags.size() < std::numeric_limits<std::uint16_t>::max()) {
        tags.push_back(line.tag);
      }
      pending.push_back({target, compactLine(line.number), tagIndex});
      if (pending.size() >= std::max<std::size_t>(4096, 2 * pendingAfterPrune)) prunePending();
    } else {
      checkPointerKind(line.number, line.tag, line.value, entry);
    }
    if (self == kNone || line.level != 1) return;
    if (kind == Kind::kIndividual && (line.tag == "FAMS" || line.tag == "FAMC")) {
      links.push_back({target, self, compactLine(line.number),
                       line.tag == "FAMC", false});
    } else if (kind == Kind::kFamily &&
               (line.tag == "HUSB" || line.tag == "WIFE" || line.tag == "CHIL")) {
      links.push_back({self, target, compactLine(line.number),
                       line.tag == "CHIL", true});
      Family& family = families[ids[self].index];
      if (line.tag == "HUSB" && family.husband == kNone) family.husband = target;
      if (line.tag == "WIFE" && family.wife == kNone) family.wife = target;
    }
  }

  // Forward pointers are the rule (a person's FAMS before the family), so
  // drop those whose target has since been defined with the right kind: the
  // end would find nothing to say about them. The rest keep their order.
  void prunePending() {
    std::erase_if(pending, [this](const PendingPointer& pointer) {
      const Kind target = ids[pointer.target].kind;
      if (target == Kind::kUndefined) return false;
      const Kind expected = pointer.tag < tags.size() ? expectedKind(tags[pointer.tag]) : Kind::kUndefined;
      return expected == Kind::kUndefined || expected == target;
    });
    pendingAfterPrune = pending.size();
  }

  void checkPointerKind(std::uint64_t line, std::string_view tag, std::string_view value,
                        const IdEntry& entry) {
    const Kind expected = expectedKind(tag);
    if (expected == Kind::kUndefined || entry.kind == expected) return;
    emit(line, "pointer-wrong-type",
         std::string(tag) + " points to " + std::string(value) + ", which is the " +
             tagName(entry.tag) + " record on line " + std::to_string(entry.line) + ".",
         tag, value);
  }

  // ---- The end -----------------------------------------------------------

  void finishCheck() {
    if (finished) return;
    finished = true;
    reader.finish();
    summary.lines = reader.lineCount();
    summary.bytes = reader.byteCount();
    summary.encoding = KXGEncodingDisplayName(reader.encoding());
    if (summary.records == 0) {
      emit(1, "file-empty", "The file holds no GEDCOM record.", "", "");
      return;
    }
    if (!sawTrailer) {
      emit(summary.lines, "trailer-missing",
           "The file does not end with 0 TRLR: it may have been cut short.", "", "");
    }
    checkPendingPointers();
    checkLinks();
    checkIndividuals();
    checkFamilies();
  }

  std::string_view idOf(std::uint32_t id) const {
    return id < idTable.size() ? idTable.text(id) : std::string_view("?");
  }

  void checkPendingPointers() {
    for (const PendingPointer& pointer : pending) {
      const IdEntry& entry = ids[pointer.target];
      const std::string_view tag =
          pointer.tag < tags.size() ? std::string_view(tags[pointer.tag]) : std::string_view();
      const std::string_view target = idOf(pointer.target);
      if (entry.kind == Kind::kUndefined) {
        emit(pointer.line, "pointer-missing",
             std::string(tag) + " points to " + std::string(target) + ", which does not exist.",
             tag, target);
      } else {
        checkPointerKind(pointer.line, tag, target, entry);
      }
    }
  }

  static std::uint64_t linkKey(const Link& link) {
    return (std::uint64_t{link.family} << 33) | (std::uint64_t{link.individual} << 1) |
           (link.child ? 1 : 0);
  }

  // Marks the links of one side whose other side exists. Sorted keys are
  // smaller and faster than a hash set; one side at a time halves the peak.
  void pairLinks(bool fromFamily) {
    std::size_t count = 0;
    for (std::size_t i = 0; i < links.size(); ++i) count += links[i].fromFamily != fromFamily ? 1 : 0;
    std::vector<std::uint64_t> otherSide;
    otherSide.reserve(count);  // exact: growing by doubling would raise the peak
    for (std::size_t i = 0; i < links.size(); ++i) {
      if (links[i].fromFamily != fromFamily) otherSide.push_back(linkKey(links[i]));
    }
    std::sort(otherSide.begin(), otherSide.end());
    for (std::size_t i = 0; i < links.size(); ++i) {
      Link& link = links[i];
      if (link.fromFamily == fromFamily) {
        link.paired = std::binary_search(otherSide.begin(), otherSide.end(), linkKey(link));
      }
    }
  }

  void checkLinks() {
    pairLinks(true);
    pairLinks(false);
    for (std::size_t i = 0; i < links.size(); ++i) {
      const Link& link = links[i];
      if (link.paired) continue;
      const IdEntry& family = ids[link.family];
      const IdEntry& person = ids[link.individual];
      // Missing or wrong targets are reported as such already.
      if (family.kind != Kind::kFamily || person.kind != Kind::kIndividual) continue;
      const std::string familyId(idOf(link.family));
      const std::string personId(idOf(link.individual));
      std::string message;
      if (link.fromFamily) {
        message = "The family " + familyId + " lists " + personId + " as a " +
                  (link.child ? "child" : "spouse") + ", but " + personId +
                  " (line " + std::to_string(person.line) + ") has no " +
                  (link.child ? "FAMC " : "FAMS ") + familyId + ".";
      } else {
        message = personId + " names the family " + familyId + " as " +
                  (link.child ? "FAMC" : "FAMS") + ", but " + familyId +
                  " (line " + std::to_string(family.line) + ") does not list " + personId +
                  (link.child ? " as a child." : " as a spouse.");
      }
      emit(link.line, "link-one-sided", std::move(message),
           link.fromFamily ? (link.child ? "CHIL" : "HUSB/WIFE")
                           : (link.child ? "FAMC" : "FAMS"),
           link.fromFamily ? personId : familyId);
    }
  }

  void dateFinding(const EventSpan& at, std::string_view code, std::string message) {
    emit(at.line, code, std::move(message), "DATE", eventText(at));
  }

  void checkIndividuals() {
    for (std::size_t i = 0; i < individuals.size(); ++i) {
      const Individual& person = individuals[i];
      if (person.events == 0) continue;
      const std::string id(idOf(person.id));
      const EventSpan birth = eventOf(person, kBirth);
      const EventSpan death = eventOf(person, kDeath);
      const EventSpan baptism = eventOf(person, kBaptism);
      const EventSpan burial = eventOf(person, kBurial);
      if (birth.known() && death.known() && birth.earliest > death.latest) {
        dateFinding(birth, "birth-after-death",
                    id + " is born (" + eventText(birth) + ") after dying (" + eventText(death) +
                        ", line " + std::to_string(death.line) + ").");
      }
      if (birth.known() && baptism.known() && baptism.latest < birth.earliest) {
        dateFinding(baptism, "baptism-before-birth",
                    id + " is baptised (" + eventText(baptism) + ") before being born (" +
                        eventText(birth) + ", line " + std::to_string(birth.line) + ").");
      }
      if (death.known() && burial.known() && burial.latest < death.earliest) {
        dateFinding(burial, "burial-before-death",
                    id + " is buried (" + eventText(burial) + ") before dying (" +
                        eventText(death) + ", line " + std::to_string(death.line) + ").");
      }
      if (birth.known() && death.known() && birth.latest < KXGDateReading::kOpenEnd &&
          death.earliest > KXGDateReading::kOpenStart &&
          death.earliest - birth.latest > yearsInDays(options.maxAge)) {
        dateFinding(death, "age-at-death",
                    id + " dies at least " + std::to_string(years(death.earliest - birth.latest)) +
                        " years old (born " + eventText(birth) + ", line " +
                        std::to_string(birth.line) + "), more than " +
                        std::to_string(options.maxAge) + ".");
      }
    }
  }

  const Individual* individualOf(std::uint32_t id) const {
    if (id == kNone || id >= ids.size() || ids[id].kind != Kind::kIndividual) return nullptr;
    return &individuals[ids[id].index];
  }

  void checkParent(const Individual& child, const Individual& parent, bool mother) {
    const EventSpan born = eventOf(child, kBirth);
    const std::string childId(idOf(child.id));
    const std::string parentId(idOf(parent.id));
    const std::string who = (mother ? "mother " : "father ") + parentId;
    const EventSpan parentBirth = eventOf(parent, kBirth);
    if (parentBirth.known() && born.latest < KXGDateReading::kOpenEnd &&
        parentBirth.earliest > KXGDateReading::kOpenStart &&
        born.latest - parentBirth.earliest < yearsInDays(options.minParentAge)) {
      const std::int64_t age = years(born.latest - parentBirth.earliest);
      dateFinding(born, "parent-too-young",
                  childId + " is born (" + eventText(born) + ") " +
                      (born.latest < parentBirth.earliest
                           ? "before the " + who + " is born"
                           : "when the " + who + " is at most " + std::to_string(age)) +
                      " (born " + eventText(parentBirth) + ", line " +
                      std::to_string(parentBirth.line) + ").");
    }
    const int maxAge = mother ? options.maxMotherAge : options.maxFatherAge;
    if (parentBirth.known() && born.earliest > KXGDateReading::kOpenStart &&
        parentBirth.latest < KXGDateReading::kOpenEnd &&
        born.earliest - parentBirth.latest > yearsInDays(maxAge)) {
      dateFinding(born, mother ? "mother-too-old" : "father-too-old",
                  childId + " is born (" + eventText(born) + ") when the " + who +
                      " is at least " + std::to_string(years(born.earliest - parentBirth.latest)) +
                      " (born " + eventText(parentBirth) + ", line " +
                      std::to_string(parentBirth.line) + ").");
    }
    const EventSpan parentDeath = eventOf(parent, kDeath);
    const std::int64_t grace = mother ? 0 : 366;
    if (parentDeath.known() && parentDeath.latest < KXGDateReading::kOpenEnd &&
        born.earliest > parentDeath.latest + grace) {
      dateFinding(born, mother ? "born-after-mother-death" : "born-after-father-death",
                  childId + " is born (" + eventText(born) + ") after the " + who + " died (" +
                      eventText(parentDeath) + ", line " + std::to_string(parentDeath.line) + ").");
    }
  }

  void checkSpouse(const Family& family, const Individual& spouse, bool wife) {
    const EventSpan married = marriageOf(family);
    const EventSpan spouseBirth = eventOf(spouse, kBirth);
    const EventSpan spouseDeath = eventOf(spouse, kDeath);
    const std::string familyId(idOf(family.id));
    const std::string who = (wife ? "wife " : "husband ") + std::string(idOf(spouse.id));
    if (spouseBirth.known() && married.latest < spouseBirth.earliest) {
      dateFinding(married, "marriage-before-birth",
                  "The family " + familyId + " marries (" + eventText(married) + ") before the " +
                      who + " is born (" + eventText(spouseBirth) + ", line " +
                      std::to_string(spouseBirth.line) + ").");
    }
    if (spouseDeath.known() && married.earliest > spouseDeath.latest) {
      dateFinding(married, "marriage-after-death",
                  "The family " + familyId + " marries (" + eventText(married) + ") after the " +
                      who + " died (" + eventText(spouseDeath) + ", line " +
                      std::to_string(spouseDeath.line) + ").");
    }
  }

  void checkFamilies() {
    // Children of each family, from either side of the link, once each.
    std::vector<std::pair<std::uint32_t, std::uint32_t>> children;  // family index, child id
    std::size_t count = 0;
    for (std::size_t i = 0; i < links.size(); ++i) count += links[i].child ? 1 : 0;
    children.reserve(count);
    for (std::size_t i = 0; i < links.size(); ++i) {
      const Link& link = links[i];
      if (!link.child || ids[link.family].kind != Kind::kFamily) continue;
      children.emplace_back(ids[link.family].index, std::uint32_t{link.individual});
    }
    std::sort(children.begin(), children.end());
    children.erase(std::unique(children.begin(), children.end()), children.end());
    for (const auto& [familyIndex, childId] : children) {
      const Individual* child = individualOf(childId);
      if (child == nullptr || (child->events & (1u << kBirth)) == 0) continue;
      const Family& family = families[familyIndex];
      if (const Individual* mother = individualOf(family.wife)) checkParent(*child, *mother, true);
      if (const Individual* father = individualOf(family.husband)) checkParent(*child, *father, false);
    }
    for (std::size_t i = 0; i < families.size(); ++i) {
      const Family& family = families[i];
      if (family.marriage == kNone) continue;
      if (const Individual* husband = individualOf(family.husband)) checkSpouse(family, *husband, false);
      if (const Individual* wife = individualOf(family.wife)) checkSpouse(family, *wife, true);
    }
  }
};

KXGChecker::KXGChecker(KXGCheckOptions options, KXGCheckerDelegate* delegate)
    : impl_(std::make_unique<Impl>(*this, std::move(options), delegate)) {}

KXGChecker::~KXGChecker() = default;

void KXGChecker::appendBytes(std::span<const std::uint8_t> bytes) { impl_->reader.appendBytes(bytes); }

void KXGChecker::finish() { impl_->finishCheck(); }

bool KXGChecker::checkFile(const std::filesystem::path& path,
                           const std::function<void(std::uint64_t, std::uint64_t)>& progress) {
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) return false;
  std::FILE* probe = std::fopen(path.c_str(), "rb");
  if (probe == nullptr) return false;
  std::fclose(probe);
  const bool ok = impl_->reader.readFile(path, progress);
  impl_->finishCheck();
  return ok;
}

const KXGSummary& KXGChecker::summary() const noexcept { return impl_->summary; }

namespace {
struct Collector final : KXGCheckerDelegate {
  std::vector<KXGFinding>* findings;
  explicit Collector(std::vector<KXGFinding>* out) : findings(out) {}
  void checkerDidFindProblem(KXGChecker&, const KXGFinding& finding) override {
    findings->push_back(finding);
  }
};
}  // namespace

KXGReport KXGChecker::reportForBytes(std::span<const std::uint8_t> bytes,
                                     const KXGCheckOptions& options) {
  KXGReport report;
  Collector collector(&report.findings);
  KXGChecker checker(options, &collector);
  checker.appendBytes(bytes);
  checker.finish();
  report.summary = checker.summary();
  return report;
}

KXGReport KXGChecker::reportForFile(const std::filesystem::path& path,
                                    const KXGCheckOptions& options) {
  KXGReport report;
  Collector collector(&report.findings);
  KXGChecker checker(options, &collector);
  report.readable = checker.checkFile(path);
  report.summary = checker.summary();
  return report;
}
