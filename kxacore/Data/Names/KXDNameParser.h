// KXDNameParser: splits one free-text personal name into title, given names,
// family name, nickname and suffix.
//
//   KXDNameParser parser;
//   parser.parseName("Dr. John Smith");     // kKXDNameTitleFound
//   parser.title();                          // "Dr."
//   parser.given();                          // "Dr. John" (the title stays)
//   parser.family();                         // "Smith"
//   parser.parseName("Smith, John Jr.");
//   parser.fullName();                       // "John /Smith/ Jr."
//
// Shapes it understands, tried in this order:
//   - the plain record form "John Paul /Smith/" (ASCII letters only), taken as
//     it stands: no title, nickname or suffix is looked for;
//   - the family between slashes ("John /Smith/ Jr."), between backslashes
//     ("John \Smith\"), or in parentheses ("John (Smith)", which keeps the
//     parentheses in family(); "John (Johnny) Smith" makes "Johnny" the
//     nickname);
//   - otherwise words: "Smith, John" is read as "John Smith"; the last word is
//     the family, extended backwards over particles ("Maria de la Cruz") or
//     by a Portuguese generation word ("Pedro Alves Neto"); a name without a
//     space or comma is all family ("Plato").
// Generational and professional suffixes ("Jr.", "PhD", "M.D.", "III") go to
// suffix(), space-separated in the order found. A title at the start ("Dr.",
// "Lieut. Col.", "Wg Cdr") is reported by title() but is NOT removed from the
// given names. A nickname in double quotes is reported and stays in place.
// Words are told apart by ASCII rules: "\b" boundaries and the plain form see
// only ASCII letters; non-ASCII names still split at spaces and commas.
//
// Results are UTF-8 slices of the input (or joins of them). Input that is not
// valid UTF-8 matches none of the expressions and ends as plain words; it
// never crashes or hangs.
//
// Thread contract: a parser object serves one thread at a time (parseName and
// the setters write its fields; the const getters may run concurrently with
// each other). Parsers on different threads are safe to use at the same time:
// the expressions they share are compiled once per process and every parse
// holds one process-wide lock while it uses them, so parses on different
// threads run one after another (a parse takes a few microseconds). For
// parallel throughput, shard the work by process rather than by thread.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

// Outcome bits of KXDNameParser::parseName.
// The input is empty or white space only: nothing was parsed and every field
// keeps the value of the previous parse.
inline constexpr std::int64_t kKXDNameEmptyInput = 2;
inline constexpr std::int64_t kKXDNameTitleFound = 4;
inline constexpr std::int64_t kKXDNameNickNameFound = 8;
// family / given were never set: only an empty input given to a parser that
// has never parsed (nor had the field set) reports these, so a fresh parser
// given "" returns 2 | 16 | 32 = 50.
inline constexpr std::int64_t kKXDNameFamilyAbsent = 16;
inline constexpr std::int64_t kKXDNameGivenAbsent = 32;

class KXDNameParser {
 public:
  // Every field empty (and given and family absent, see the outcome bits).
  // Cheap: the shared expressions are built on the first parse.
  KXDNameParser() = default;
  // A parser holds per-parse state and is used by one thread: not copyable.
  KXDNameParser(const KXDNameParser&) = delete;
  KXDNameParser& operator=(const KXDNameParser&) = delete;

  // Parses `name` (left untrimmed; only the emptiness test trims) and returns
  // the outcome bits above. A non-empty parse first resets every field to "".
  std::int64_t parseName(std::string_view name);

  // The title as matched at the start of the name ("Dr."), or "".
  [[nodiscard]] const std::string& title() const { return title_; }
  // Given names separated by single spaces; may include the title and a
  // quoted or parenthesised nickname.
  [[nodiscard]] const std::string& given() const { return given_; }
  // One or more words; "" for an explicitly empty family ("John //").
  [[nodiscard]] const std::string& family() const { return family_; }
  [[nodiscard]] const std::string& nickName() const { return nickName_; }
  // Suffixes separated by single spaces, in the order found.
  [[nodiscard]] const std::string& suffix() const { return suffix_; }
  // Not the stored input: the record form "given /family/ suffix", trimmed
  // ("John /Smith/ Jr.", "John /Smith/"). Composed on each call.
  [[nodiscard]] std::string fullName() const;
  // The input of the last non-empty parse (or what setFullName stored).
  [[nodiscard]] const std::string& originalName() const { return fullName_; }

  void setTitle(std::string_view title) { title_.assign(title); }
  void setGiven(std::string_view given);
  void setFamily(std::string_view family);
  void setNickName(std::string_view nickName) { nickName_.assign(nickName); }
  void setSuffix(std::string_view suffix) { suffix_.assign(suffix); }
  // Stores the input text that originalName() returns; parses nothing.
  void setFullName(std::string_view fullName) { fullName_.assign(fullName); }

 private:
  void parseNameString(std::string_view name);
  void findTitles(std::string_view name);
  // `expression` 0: slashes, 1: backslashes, 2: parentheses.
  bool matchSlashesUsingRegex(int expression);
  void matchName();
  [[nodiscard]] bool isSingleWordName() const;
  [[nodiscard]] static std::size_t numberOfFamilyNames(const std::vector<std::string_view>& words);
  [[nodiscard]] static bool isFamilyNamePart(std::string_view word);
  [[nodiscard]] static std::string concatenateLastStringsFromArray(
      const std::vector<std::string_view>& words, std::size_t startingFrom);
  // The suffixes present in the stored input, as written. Depends only on the
  // stored input, so it is computed once per parse.
  const std::vector<std::string>& getKnownSuffixes();
  [[nodiscard]] std::string parseSuffixesIn(std::string_view text, bool stripPunctuation);
  // Cuts a trailing roman numeral off `name`; returns it ("" when none).
  [[nodiscard]] static std::string_view parseRomanNumeralSuffixes(std::string& name);
  // Appends `numeral` (when not empty), then each known suffix, to suffix_.
  void setSuffixFromArray(std::string_view numeral, const std::vector<std::string>& suffixes);

  std::string title_;
  std::string fullName_;  // the stored input
  std::string given_;
  std::string family_;
  std::string nickName_;
  std::string suffix_;
  // Absent is not the same as empty for the outcome bits: a parse or a setter
  // makes the field present for good.
  bool hasGiven_ = false;
  bool hasFamily_ = false;

  std::vector<std::string> knownSuffixes_;
  bool knownSuffixesReady_ = false;
  std::vector<std::string_view> words_;  // scratch of matchName, kept for its capacity
};
