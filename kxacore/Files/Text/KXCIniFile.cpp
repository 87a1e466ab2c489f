#include "kxacore/Files/Text/KXCIniFile.h"

#include <nlohmann/json.hpp>

#include "kxacore/Files/Text/KXCIniFileSerialization.h"
#include "kxacore/Platform/KXAStringFormat.h"

namespace {

constexpr std::string_view kNameKey = "name";
constexpr std::string_view kContentKey = "content";

// Property-list text form of a string: bare when it is a plain word.
void appendQuoted(std::string& out, std::string_view text) {
  const bool bare = !text.empty() && text.find_first_not_of(
                                         "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                         "0123456789_.$/:-") == std::string_view::npos;
  if (bare) {
    out.append(text);
    return;
  }
  out.push_back('"');
  for (const char c : text) {
    if (c == '"' || c == '\\') out.push_back('\\');
    if (c == '\n') {
      out.append("\\n");
      continue;
    }
    out.push_back(c);
  }
  out.push_back('"');
}

void appendDictionary(std::string& out, const KXCIniSection::Content& content,
                      std::string_view indent) {
  out.append("{\n");
  for (const auto& [key, value] : content) {
    out.append(indent).append("    ");
    appendQuoted(out, key);
    out.append(" = ");
    appendQuoted(out, value);
    out.append(";\n");
  }
  out.append(indent).append("}");
}

}  // namespace

KXCIniSection KXCIniSection::sectionWithName(std::string_view name) {
  return KXCIniSection(std::string(name), nullptr);
}

KXCIniSection::KXCIniSection(std::string name, std::shared_ptr<Content> content)
    : name_(std::move(name)), content_(content ? std::move(content) : std::make_shared<Content>()) {}

void KXCIniSection::setContent(std::shared_ptr<Content> content) {
  content_ = content ? std::move(content) : std::make_shared<Content>();
}

std::vector<std::string> KXCIniSection::allKeys() const {
  std::vector<std::string> keys;
  keys.reserve(content_->size());
  for (const auto& entry : *content_) keys.push_back(entry.first);
  return keys;
}

bool KXCIniSection::setValue(const nlohmann::json& value, std::string_view key) {
  if (value.is_string()) return setValue(value.get_ref<const std::string&>(), key);
  if (key != kContentKey || !value.is_object()) return false;
  auto content = std::make_shared<Content>();
  for (const auto& [entryKey, entryValue] : value.items()) {
    if (!entryValue.is_string()) return false;
    content->emplace(entryKey, entryValue.get<std::string>());
  }
  content_ = std::move(content);
  return true;
}

bool KXCIniSection::setValue(std::string_view value, std::string_view key) {
  if (key == kContentKey) return false;
  if (key == kNameKey) {
    name_ = value;
    return true;
  }
  const auto found = content_->find(key);
  if (found != content_->end()) {
    found->second = value;
  } else {
    content_->emplace(std::string(key), std::string(value));
  }
  return true;
}

std::optional<std::string> KXCIniSection::valueForKey(std::string_view key) const {
  if (key == kNameKey) return name_;
  if (key == kContentKey) return std::nullopt;
  const auto found = content_->find(key);
  if (found == content_->end()) return std::nullopt;
  return found->second;
}

nlohmann::json KXCIniSection::jsonValueForKey(std::string_view key) const {
  if (key == kContentKey) {
    nlohmann::json object = nlohmann::json::object();
    for (const auto& [entryKey, value] : *content_) object[entryKey] = value;
    return object;
  }
  const std::optional<std::string> value = valueForKey(key);
  return value ? nlohmann::json(*value) : nlohmann::json(nullptr);
}

void KXCIniSection::removeValueForKey(std::string_view key) {
  const auto found = content_->find(key);
  if (found != content_->end()) content_->erase(found);
}

std::string KXCIniSection::description() const {
  std::string dictionary;
  appendDictionary(dictionary, *content_, "");
  return KXAStringWithFormat("section:%@ \n%@", name_, dictionary);
}

std::unique_ptr<KXCIniFile> KXCIniFile::iniFile() { return std::make_unique<KXCIniFile>(); }

std::unique_ptr<KXCIniFile> KXCIniFile::iniWithContentsOfFile(const std::filesystem::path& path,
                                                              std::int64_t format) {
  return KXCIniFileSerialization::iniFromFile(path, format);
}

bool KXCIniFile::writeToFile(const std::filesystem::path& path, std::int64_t format) const {
  return KXCIniFileSerialization::writeIni(*this, path, format);
}

std::vector<std::string> KXCIniFile::sectionsNames() const {
  std::vector<std::string> names;
  names.reserve(content_.size());
  for (const auto& entry : content_) names.push_back(entry.first);
  return names;
}

void KXCIniFile::setSection(const KXCIniSection& section) {
  content_.insert_or_assign(section.name(), section.sharedContent());
}

std::optional<KXCIniSection> KXCIniFile::sectionForName(std::string_view name) const {
  const auto found = content_.find(name);
  if (found == content_.end()) return std::nullopt;
  return KXCIniSection(found->first, found->second);
}

void KXCIniFile::removeSectionForName(std::string_view name) {
  const auto found = content_.find(name);
  if (found != content_.end()) content_.erase(found);
}

std::string KXCIniFile::description() const {
  std::string dictionary = "{\n";
  for (const auto& [name, content] : content_) {
    dictionary.append("    ");
    appendQuoted(dictionary, name);
    dictionary.append(" = ");
    appendDictionary(dictionary, *content, "    ");
    dictionary.append(";\n");
  }
  dictionary.append("}");
  return KXAStringWithFormat("ini:\n%@", dictionary);
}
