#include "kxacore/Platform/KXAStringFormat.h"

#include <cstdio>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"

namespace {

// Appends a code point as UTF-8; lone surrogates and values beyond Unicode
// become U+FFFD so the result stays valid UTF-8.
void appendCodePoint(std::string& out, std::uint32_t cp) {
  if ((cp >= 0xD800 && cp <= 0xDFFF) || cp > 0x10FFFF) cp = 0xFFFD;
  if (cp < 0x80) {
    out += static_cast<char>(cp);
  } else if (cp < 0x800) {
    out += static_cast<char>(0xC0 | (cp >> 6));
    out += static_cast<char>(0x80 | (cp & 0x3F));
  } else if (cp < 0x10000) {
    out += static_cast<char>(0xE0 | (cp >> 12));
    out += static_cast<char>(0x80 | ((cp >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (cp & 0x3F));
  } else {
    out += static_cast<char>(0xF0 | (cp >> 18));
    out += static_cast<char>(0x80 | ((cp >> 12) & 0x3F));
    out += static_cast<char>(0x80 | ((cp >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (cp & 0x3F));
  }
}

// One conversion directive ("%-5.2ld"), already split into its parts.
struct Directive {
  std::string flags;
  int width = -1;
  int precision = -1;
  char conversion = 0;
};

std::int64_t asInteger(const KXAFormatArg& arg) {
  switch (arg.kind()) {
    case KXAFormatArg::Kind::kInteger: return arg.integer();
    case KXAFormatArg::Kind::kDouble: return static_cast<std::int64_t>(arg.number());
    case KXAFormatArg::Kind::kText: return kxa_integerValue(arg.text());
  }
  return 0;
}

double asDouble(const KXAFormatArg& arg) {
  switch (arg.kind()) {
    case KXAFormatArg::Kind::kInteger: return static_cast<double>(arg.integer());
    case KXAFormatArg::Kind::kDouble: return arg.number();
    case KXAFormatArg::Kind::kText: return static_cast<double>(kxa_integerValue(arg.text()));
  }
  return 0;
}

std::string printfDirective(const Directive& directive, std::string_view length) {
  std::string out = "%" + directive.flags;
  if (directive.width >= 0) out += std::to_string(directive.width);
  if (directive.precision >= 0) {
    out += '.';
    out += std::to_string(directive.precision);
  }
  out += length;
  out += directive.conversion;
  return out;
}

template <typename T>
void appendPrintf(std::string& out, const std::string& format, T value) {
  char buffer[128];
  const int needed = std::snprintf(buffer, sizeof buffer, format.c_str(), value);
  if (needed < 0) return;
  if (static_cast<std::size_t>(needed) < sizeof buffer) {
    out.append(buffer, static_cast<std::size_t>(needed));
    return;
  }
  std::vector<char> large(static_cast<std::size_t>(needed) + 1);
  std::snprintf(large.data(), large.size(), format.c_str(), value);
  out.append(large.data(), static_cast<std::size_t>(needed));
}

// Pads a text to the directive's width, honouring "-" for left alignment; a
// precision cuts the text to that many bytes (as printf's %.Ns does).
void appendText(std::string& out, const Directive& directive, std::string_view text) {
  if (directive.precision >= 0 && static_cast<std::size_t>(directive.precision) < text.size()) {
    text = text.substr(0, static_cast<std::size_t>(directive.precision));
  }
  const std::size_t width = directive.width > 0 ? static_cast<std::size_t>(directive.width) : 0;
  const std::size_t padding = width > text.size() ? width - text.size() : 0;
  const bool left = directive.flags.find('-') != std::string::npos;
  if (!left) out.append(padding, ' ');
  out.append(text);
  if (left) out.append(padding, ' ');
}

void appendArgument(std::string& out, const Directive& directive, const KXAFormatArg& arg) {
  switch (directive.conversion) {
    case '@':
    case 's':
      if (arg.kind() == KXAFormatArg::Kind::kText) {
        appendText(out, directive, arg.text());
      } else if (arg.kind() == KXAFormatArg::Kind::kInteger) {
        appendText(out, directive, std::to_string(arg.integer()));
      } else {
        std::string number;
        appendPrintf(number, "%g", arg.number());
        appendText(out, directive, number);
      }
      return;
    case 'd': case 'i':
      appendPrintf(out, printfDirective(directive, "ll"), static_cast<long long>(asInteger(arg)));
      return;
    case 'u': case 'x': case 'X': case 'o':
      appendPrintf(out, printfDirective(directive, "ll"), static_cast<unsigned long long>(asInteger(arg)));
      return;
    case 'c': {
      std::string one(1, static_cast<char>(asInteger(arg)));
      appendText(out, directive, one);
      return;
    }
    case 'C': {
      std::string one;
      appendCodePoint(one, static_cast<std::uint32_t>(asInteger(arg)));
      appendText(out, directive, one);
      return;
    }
    case 'f': case 'F': case 'e': case 'E': case 'g': case 'G':
      appendPrintf(out, printfDirective(directive, ""), asDouble(arg));
      return;
    default:
      return;
  }
}

bool isDigit(char c) { return c >= '0' && c <= '9'; }

int readNumber(std::string_view format, std::size_t& i) {
  int value = 0;
  while (i < format.size() && isDigit(format[i])) {
    if (value < 100000) value = value * 10 + (format[i] - '0');
    ++i;
  }
  return value;
}

}  // namespace

std::string KXAStringWithFormatArgs(std::string_view format,
                                    std::initializer_list<KXAFormatArg> args) {
  std::string out;
  out.reserve(format.size() + 16 * args.size());
  std::size_t nextArg = 0;
  std::size_t i = 0;
  while (i < format.size()) {
    const std::size_t percent = format.find('%', i);
    if (percent == std::string_view::npos) {
      out.append(format.substr(i));
      break;
    }
    out.append(format.substr(i, percent - i));
    i = percent + 1;
    if (i >= format.size()) break;  // a lone "%" at the end prints nothing
    if (format[i] == '%') {
      out += '%';
      ++i;
      continue;
    }
    Directive directive;
    // Positional argument "%2$@".
    std::size_t position = 0;
    if (isDigit(format[i])) {
      std::size_t j = i;
      const int n = readNumber(format, j);
      if (j < format.size() && format[j] == '$' && n > 0) {
        position = static_cast<std::size_t>(n);
        i = j + 1;
      }
    }
    while (i < format.size() && std::string_view("-+ #0'").find(format[i]) != std::string_view::npos) {
      if (format[i] != '\'') directive.flags += format[i];
      ++i;
    }
    if (i < format.size() && isDigit(format[i])) directive.width = readNumber(format, i);
    if (i < format.size() && format[i] == '.') {
      ++i;
      directive.precision = readNumber(format, i);
    }
    while (i < format.size() && std::string_view("hlqLzjt").find(format[i]) != std::string_view::npos) ++i;
    if (i >= format.size()) {
      out.append(format.substr(percent));  // unterminated: keep the text as written
      break;
    }
    directive.conversion = format[i++];
    if (std::string_view("@sdiuxXocCfFeEgG").find(directive.conversion) == std::string_view::npos) {
      out.append(format.substr(percent, i - percent));  // unknown: keep as written
      continue;
    }
    const std::size_t index = position > 0 ? position - 1 : nextArg++;
    if (index < args.size()) appendArgument(out, directive, *(args.begin() + index));
  }
  return out;
}
