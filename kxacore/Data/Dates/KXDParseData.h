// File: KXDParseData.h
//
// The two small records of one date parse: KXDParseErrorInfo (one problem
// found in the text) and KXDParseData (the parse in progress: the text, the
// two date codes found so far, the qualifier and the problems).
//
//   KXDParseData data("abt 1850");
//   data.addError(kKXDParseErrorTwoDigitYear, "50");
//   data.setErrorsInPriorityOrder();
//
// Thread safety: plain values; a const one may be read from any thread.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

// Error reasons. 1 to 5 are warnings about an unlikely date (severity 2);
// 6 and above are errors (severity 1). A higher number ranks first.
inline constexpr int kKXDParseErrorNone = 0;
inline constexpr int kKXDParseErrorTwoDigitYear = 1;
inline constexpr int kKXDParseErrorOneDigitYear = 2;
inline constexpr int kKXDParseErrorDoubleDateAmbiguous = 3;
inline constexpr int kKXDParseErrorFutureDate = 4;
inline constexpr int kKXDParseErrorWrongAncientDate = 5;
inline constexpr int kKXDParseErrorDayOutOfRange = 6;
inline constexpr int kKXDParseErrorMonthOutOfRange = 7;
inline constexpr int kKXDParseErrorYearOutOfRange = 8;
inline constexpr int kKXDParseErrorNotLeapYear = 9;
inline constexpr int kKXDParseErrorInvalidDoubleDate = 10;
inline constexpr int kKXDParseErrorRange = 11;
inline constexpr int kKXDParseErrorUnknown = 12;
inline constexpr int kKXDParseErrorUnknownContent = 13;

// The string-table key of a reason's message; empty for any other reason.
// Only the messages of reasons 4 and 9 are formats (one %@ for the data).
[[nodiscard]] std::string_view KXDParseErrorMessageKey(int reason) noexcept;
// 0 for reason 0, 2 for reasons 1 to 5, 1 above 5 (also for unknown reasons).
[[nodiscard]] int KXDParseErrorSeverity(int reason) noexcept;

// One problem: its reason, the text its message quotes, and whether it
// belongs to the second date of a range. Immutable.
class KXDParseErrorInfo {
 public:
  [[nodiscard]] static KXDParseErrorInfo errorInfoWithReason(int reason, std::string data,
                                                             bool secondDateError) {
    return KXDParseErrorInfo(reason, std::move(data), secondDateError);
  }

  [[nodiscard]] int reason() const noexcept { return reason_; }
  [[nodiscard]] const std::string& data() const noexcept { return data_; }
  [[nodiscard]] bool secondDateError() const noexcept { return secondDateError_; }
  // The localised message of the reason; reasons 4 (future date) and 9
  // (not a leap year) have data() filled in, the others do not quote it.
  [[nodiscard]] std::string message() const;

  friend bool operator==(const KXDParseErrorInfo&, const KXDParseErrorInfo&) = default;

 private:
  KXDParseErrorInfo(int reason, std::string data, bool secondDateError)
      : reason_(reason), data_(std::move(data)), secondDateError_(secondDateError) {}
  int reason_;
  std::string data_;
  bool secondDateError_;
};

// One parse in progress. A plain record: the parser reads and writes the
// fields directly. Codes are 32-bit KXDDate record codes; 0 means none.
struct KXDParseData {
  explicit KXDParseData(std::string_view text, std::int64_t first = 0, std::int64_t second = 0)
      : dateString(text), firstDate(first), secondDate(second) {}

  std::string dateString;     // the text this parse was given (quoted by reason 13)
  std::int64_t firstDate = 0;
  std::int64_t secondDate = 0;
  // Modifier bits waiting for the next date built (qualifier word, quarter,
  // dual year); consumed by each date built from a match.
  std::uint64_t qualifier = 0;
  bool parsingSecondDate = false;  // set while the second date of a range is read
  bool firstDateInited = false;
  bool secondDateInited = false;
  std::vector<KXDParseErrorInfo> dateParsingErrorInfo;

  // Appends an error, marked as a second-date error when a first date is
  // already known or the second date is being parsed.
  void addError(int reason, std::string data);

  // Ranks the errors: repeatedly picks the greatest reason (the earliest
  // among equals) and appends it, unless the last kept entry has the same
  // reason and second-date flag (then it is a duplicate and dropped).
  void setErrorsInPriorityOrder();
};
