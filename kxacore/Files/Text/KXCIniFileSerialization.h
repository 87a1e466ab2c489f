// Reading and writing KXCIniFile in its two storage forms.
//
// Native form (KXCIniFileFormatNative), line by line, UTF-8:
//   # comment            only '#' starts a comment, and only at line start
//   [ Main Section ]     a header; the name is trimmed, and needs at least two
//                        characters: "[A]" is no header (it is read as a bare
//                        key line). A repeated header starts its section anew.
//   key = value          key: the first run of non-space, non-'=' characters;
//                        value: everything after the first '=', untouched
//                        (" value" here, with its leading space)
//   bare line            the whole line is a key with an empty value
// Lines before the first header are dropped. Keys go through
// KXCIniSection::setValue, so a key "name" renames the section object rather
// than storing an entry, and a key "content" is refused. A leading UTF-8
// byte-order mark is skipped. Lines end at LF, CR LF, CR and the Unicode line
// and paragraph separators.
// Writing gives "[name]" then "key=value" (or the bare key when the value is
// empty) per entry, sections and keys sorted, nothing quoted or escaped: a
// key holding '=' or starting with white space does not survive a round trip.
//
// Property-list form (KXCIniFileFormatPropertyList): a dictionary of section
// name to a dictionary of key to string. Reads XML and binary property lists;
// top-level entries that are not dictionaries are skipped; inside a section,
// strings are kept, numbers stored as their decimal text (booleans as "1" and
// "0", reals in their shortest exact form, integers of 2^63 and above as
// negative, as the reader cannot tell the two apart), other values skipped.
// Writes XML.
//
// Every write is atomic (write beside, then rename). Failures give nullptr /
// false; nothing throws.
//
// Thread safety: serializators hold no state; any thread may use its own or a
// shared one. Native reading shares three compiled expressions, taken one
// reader at a time under a lock.
#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <string>
#include <string_view>

#include "kxacore/Files/Text/KXCIniFile.h"

inline constexpr std::int64_t KXCIniFileFormatPropertyList = 0;
inline constexpr std::int64_t KXCIniFileFormatNative = 1;

class KXCIniFileSerializator {
 public:
  virtual ~KXCIniFileSerializator() = default;
  // The serializator of `format`; nullptr for any value but the two formats.
  [[nodiscard]] static std::unique_ptr<KXCIniFileSerializator> serializatorForFormat(
      std::int64_t format);
  // The base reads nothing and writes nothing.
  [[nodiscard]] virtual std::unique_ptr<KXCIniFile> iniFromFile(
      const std::filesystem::path& path) const;
  [[nodiscard]] virtual bool writeIni(const KXCIniFile& ini,
                                      const std::filesystem::path& path) const;
};

class KXCIniFileNativeSerializator : public KXCIniFileSerializator {
 public:
  // nullptr when the file cannot be read or is not UTF-8.
  [[nodiscard]] std::unique_ptr<KXCIniFile> iniFromFile(
      const std::filesystem::path& path) const override;
  [[nodiscard]] bool writeIni(const KXCIniFile& ini,
                              const std::filesystem::path& path) const override;
  // The same over text in memory: nullptr when `text` is not UTF-8.
  [[nodiscard]] static std::unique_ptr<KXCIniFile> iniFromString(std::string_view text);
  [[nodiscard]] static std::string stringFromIni(const KXCIniFile& ini);
};

class KXCIniFilePropertyListSerializator : public KXCIniFileSerializator {
 public:
  // nullptr when the file is not a property list holding a dictionary.
  [[nodiscard]] std::unique_ptr<KXCIniFile> iniFromFile(
      const std::filesystem::path& path) const override;
  [[nodiscard]] bool writeIni(const KXCIniFile& ini,
                              const std::filesystem::path& path) const override;
  // The same over bytes in memory (XML or binary).
  [[nodiscard]] static std::unique_ptr<KXCIniFile> iniFromData(std::span<const std::uint8_t> data);
  // The XML property list; empty on failure.
  [[nodiscard]] static std::string xmlFromIni(const KXCIniFile& ini);
};

class KXCIniFileSerialization {
 public:
  // serializatorForFormat(format), then its iniFromFile; nullptr for an
  // unknown format.
  [[nodiscard]] static std::unique_ptr<KXCIniFile> iniFromFile(const std::filesystem::path& path,
                                                               std::int64_t format);
  // serializatorForFormat(format), then its writeIni; false for an unknown
  // format.
  [[nodiscard]] static bool writeIni(const KXCIniFile& ini, const std::filesystem::path& path,
                                     std::int64_t format);
};
