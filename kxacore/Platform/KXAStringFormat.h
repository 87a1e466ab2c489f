// Formats Objective-C style format strings ("%@", "%ld", "%02d", "%C"),
// so user-visible texts and message formats stay exactly as written.
//
// Supported conversions: %@ and %s (a text argument), %d %i %u %x %X %o
// (any integer argument, with h/hh/l/ll/q/z/j/t length modifiers accepted and
// ignored), %c (a byte) and %C (a UTF-16 unit or code point, written as
// UTF-8), %f %e %g (a double), %% and positional arguments "%1$@".
// Flags, width and precision work as in printf. A missing argument prints
// nothing; a surplus argument is ignored; an argument of the wrong kind is
// converted (a number for %@ prints as decimal text, a text for %d reads its
// leading integer). Never throws.
//
// Thread safety: pure function.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <type_traits>

// One argument: a text, an integer or a floating-point number. Holds a view:
// the text must outlive the format call (a temporary in the call is fine).
class KXAFormatArg {
 public:
  enum class Kind { kText, kInteger, kDouble };
  KXAFormatArg(std::string_view text) noexcept : kind_(Kind::kText), text_(text) {}
  KXAFormatArg(const std::string& text) noexcept : kind_(Kind::kText), text_(text) {}
  KXAFormatArg(const char* text) noexcept : kind_(Kind::kText), text_(text ? text : "") {}
  template <typename T, std::enable_if_t<std::is_integral_v<T>, int> = 0>
  KXAFormatArg(T value) noexcept : kind_(Kind::kInteger), integer_(static_cast<std::int64_t>(value)) {}
  template <typename T, std::enable_if_t<std::is_floating_point_v<T>, int> = 0>
  KXAFormatArg(T value) noexcept : kind_(Kind::kDouble), double_(static_cast<double>(value)) {}

  Kind kind() const noexcept { return kind_; }
  std::string_view text() const noexcept { return text_; }
  std::int64_t integer() const noexcept { return integer_; }
  double number() const noexcept { return double_; }

 private:
  Kind kind_;
  std::string_view text_;
  std::int64_t integer_ = 0;
  double double_ = 0;
};

[[nodiscard]] std::string KXAStringWithFormatArgs(std::string_view format,
                                                  std::initializer_list<KXAFormatArg> args);

template <typename... Args>
[[nodiscard]] std::string KXAStringWithFormat(std::string_view format, const Args&... args) {
  return KXAStringWithFormatArgs(format, {KXAFormatArg(args)...});
}
