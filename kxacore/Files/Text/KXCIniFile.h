// KXCIniFile and KXCIniSection: a small model of an INI file, named sections
// of string keys and string values, read and written in either storage form
// by KXCIniFileSerialization (KXCIniFileSerialization.h).
//
//   auto ini = KXCIniFile::iniWithContentsOfFile("app.ini", KXCIniFileFormatNative);
//   if (!ini) return;                                  // unreadable
//   if (auto section = ini->sectionForName("Main")) {
//     section->setValue("42", "answer");               // changes `ini` too
//   }
//   ini->writeToFile("app.ini", KXCIniFileFormatNative);
//
// Sharing: a section obtained from a file shares the file's dictionary, so
// changes through the section change the file. Copies of a KXCIniSection
// share it too (they are handles on one dictionary).
//
// Order: sections and keys are kept sorted by name (byte order), so written
// files are deterministic and diff well; nothing keeps the order of the file
// that was read.
//
// Thread safety: a file and its sections serve one thread at a time.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include <nlohmann/json_fwd.hpp>  // the "any value" of key-value coding

class KXCIniSection {
 public:
  using Content = std::map<std::string, std::string, std::less<>>;

  // A section with that name and a new empty dictionary.
  [[nodiscard]] static KXCIniSection sectionWithName(std::string_view name);
  // A section named `name` on `content`, shared; a null `content` gets a new
  // empty dictionary.
  KXCIniSection(std::string name, std::shared_ptr<Content> content);

  [[nodiscard]] const std::string& name() const { return name_; }
  void setName(std::string name) { name_ = std::move(name); }
  [[nodiscard]] const Content& content() const { return *content_; }
  [[nodiscard]] const std::shared_ptr<Content>& sharedContent() const { return content_; }
  // Replaces the dictionary this section works on (a file that shared the old
  // one keeps it); null gives a new empty one.
  void setContent(std::shared_ptr<Content> content);

  // The keys, sorted.
  [[nodiscard]] std::vector<std::string> allKeys() const;

  // Key-value coding. The keys "name" and "content" address the section's
  // own properties; every other key is an entry of content().
  //   "name": a string renames the section (the file, which stores sections
  //           by the name they had when set, is not changed).
  //   "content": an object of string values becomes a new dictionary (see
  //           setContent); anything else is refused.
  //   other keys: a string is stored; any other value is refused.
  // A refused value stores nothing and returns false; nothing throws.
  // There are no change notices: callers that care compare before and after.
  bool setValue(const nlohmann::json& value, std::string_view key);
  // The common path: always succeeds except for the key "content", which
  // takes no string.
  bool setValue(std::string_view value, std::string_view key);
  bool setValue(const std::string& value, std::string_view key) {
    return setValue(std::string_view(value), key);
  }
  bool setValue(const char* value, std::string_view key) {
    return setValue(std::string_view(value ? value : ""), key);
  }
  // The name for "name", the entry for any other key, nullopt when there is
  // none; "content" is no string and always gives nullopt (use content()).
  [[nodiscard]] std::optional<std::string> valueForKey(std::string_view key) const;
  // The same as a JSON value: "content" gives an object, a missing entry null.
  [[nodiscard]] nlohmann::json jsonValueForKey(std::string_view key) const;
  // Removes an existing entry; a missing key does nothing.
  void removeValueForKey(std::string_view key);

  // "section:<name> \n" followed by the dictionary in property-list text form.
  [[nodiscard]] std::string description() const;

 private:
  std::string name_;
  std::shared_ptr<Content> content_;
};

class KXCIniFile {
 public:
  using Sections = std::map<std::string, std::shared_ptr<KXCIniSection::Content>, std::less<>>;

  KXCIniFile() = default;
  KXCIniFile(const KXCIniFile&) = delete;
  KXCIniFile& operator=(const KXCIniFile&) = delete;

  // A new empty file.
  [[nodiscard]] static std::unique_ptr<KXCIniFile> iniFile();
  // Reads `path` in `format` (KXCIniFileFormatNative or
  // KXCIniFileFormatPropertyList); nullptr when the file cannot be read in
  // that form or the format is unknown.
  [[nodiscard]] static std::unique_ptr<KXCIniFile> iniWithContentsOfFile(
      const std::filesystem::path& path, std::int64_t format);
  // Writes atomically (write beside, then rename); false on failure or an
  // unknown format, and `path` is then untouched.
  [[nodiscard]] bool writeToFile(const std::filesystem::path& path, std::int64_t format) const;

  // The section names, sorted.
  [[nodiscard]] std::vector<std::string> sectionsNames() const;
  // Stores the section's dictionary (shared, not copied) under its name,
  // replacing any section of that name.
  void setSection(const KXCIniSection& section);
  // A section on the stored dictionary itself; nullopt when there is none.
  [[nodiscard]] std::optional<KXCIniSection> sectionForName(std::string_view name) const;
  void removeSectionForName(std::string_view name);
  [[nodiscard]] const Sections& content() const { return content_; }

  // "ini:\n" followed by the dictionary in property-list text form.
  [[nodiscard]] std::string description() const;

 private:
  Sections content_;
};
