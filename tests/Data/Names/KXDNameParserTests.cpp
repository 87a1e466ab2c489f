#include "kxacore/Data/Names/KXDNameParser.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <string>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

#include "kxacore/Data/Names/KXDNameParserInternal.h"
#include "kxacore/Platform/KXALocale.h"

namespace {

static_assert(!std::is_copy_constructible_v<KXDNameParser>);
static_assert(!std::is_copy_assignable_v<KXDNameParser>);
static_assert(kKXDNameEmptyInput == 2 && kKXDNameTitleFound == 4 && kKXDNameNickNameFound == 8 &&
              kKXDNameFamilyAbsent == 16 && kKXDNameGivenAbsent == 32);

using kxd_internal::kTitleFragments;

struct NameCase {
  const char* input;
  const char* title;
  const char* given;
  const char* family;
  const char* nickName;
  const char* suffix;
  std::int64_t outcome;
};

std::ostream& operator<<(std::ostream& os, const NameCase& c) { return os << '"' << c.input << '"'; }

class NameShapeTest : public testing::TestWithParam<NameCase> {};

TEST_P(NameShapeTest, SplitsIntoFields) {
  const NameCase& c = GetParam();
  KXDNameParser parser;
  EXPECT_EQ(parser.parseName(c.input), c.outcome);
  EXPECT_EQ(parser.title(), c.title);
  EXPECT_EQ(parser.given(), c.given);
  EXPECT_EQ(parser.family(), c.family);
  EXPECT_EQ(parser.nickName(), c.nickName);
  EXPECT_EQ(parser.suffix(), c.suffix);
  EXPECT_EQ(parser.originalName(), c.input);
}

// {input, title, given, family, nickname, suffix, outcome}

// The record form: taken whole, without looking for a title or suffix.
INSTANTIATE_TEST_SUITE_P(PlainForm, NameShapeTest, testing::Values(
    NameCase{"John /Smith/", "", "John", "Smith", "", "", 0},
    NameCase{"John Paul /Smith/", "", "John Paul", "Smith", "", "", 0},
    NameCase{"Dr John /Smith/", "", "Dr John", "Smith", "", "", 0},
    NameCase{"John III /Smith/", "", "John III", "Smith", "", "", 0},
    NameCase{"jean /DUPONT/", "", "jean", "DUPONT", "", "", 0}));

INSTANTIATE_TEST_SUITE_P(Slashes, NameShapeTest, testing::Values(
    NameCase{"John /Smith/ Jr.", "", "John", "Smith", "", "Jr.", 0},
    NameCase{"/Smith/ John", "", "John", "Smith", "", "", 0},
    NameCase{"John Quincy /Adams/ III", "", "John Quincy", "Adams", "", "III", 0},
    NameCase{"John, III /Smith/", "", "John", "Smith", "", "III", 0},
    NameCase{"John //", "", "John", "", "", "", 0},
    NameCase{"Anne /de la Tour/", "", "Anne", "de la Tour", "", "", 0},
    NameCase{"Smith, John /Smith/", "", "Smith John", "Smith", "", "", 0},
    NameCase{"Dr. John /Smith/", "Dr.", "Dr. John", "Smith", "", "", 4}));

INSTANTIATE_TEST_SUITE_P(Backslashes, NameShapeTest, testing::Values(
    NameCase{"John \\Smith\\", "", "John", "Smith", "", "", 0},
    NameCase{"John \\Smith\\ Sr", "", "John", "Smith", "", "Sr", 0},
    NameCase{"John \\\\", "", "John", "", "", "", 0},
    // What follows the family is read as after slashes: no nickname, no
    // family words taken from it.
    NameCase{"John \\Smith\\ Brown", "", "John", "Smith", "", "Brown", 0},
    NameCase{"John \\Smith\\ van Berg", "", "John", "Smith", "", "van Berg", 0},
    NameCase{"John \\Smith\\ (Jones", "", "John", "Smith", "", "(Jones", 0}));

// A parenthesised family keeps its parentheses; one followed by more words
// is a nickname.
INSTANTIATE_TEST_SUITE_P(Parentheses, NameShapeTest, testing::Values(
    NameCase{"John (Smith)", "", "John", "(Smith)", "", "", 0},
    NameCase{"John (Smith) Jr", "", "John", "(Smith)", "", "Jr", 0},
    NameCase{"John (Smith) iii", "", "John", "(Smith)", "", "iii", 0},
    NameCase{"John (Johnny) Smith", "", "John (Johnny)", "Smith", "Johnny", "", 8},
    NameCase{"John (Johnny) Smith Jr.", "", "John (Johnny)", "Smith", "Johnny", "Jr.", 8},
    NameCase{"John (Johnny) van Berg", "", "John (Johnny)", "van Berg", "Johnny", "", 8},
    NameCase{"John (Johnny) Paul Smith", "", "John (Johnny) Paul", "Smith", "Johnny", "", 8},
    // Nothing before and no suffix after: read as plain words instead.
    NameCase{"(Johnny) Paul Smith", "", "(Johnny) Paul", "Smith", "", "", 0},
    // A numeral cut from the words counts as a suffix found there.
    NameCase{"(Johnny) Paul Smith III", "", "(Johnny) Paul", "Smith", "Johnny", "III", 8},
    // A second opening parenthesis makes the rest family and suffix at once.
    NameCase{"John (Smith) (Jones", "", "John", "(Jones", "", "(Jones", 0},
    // A quoted nickname is found first and wins.
    NameCase{"Robert \"Bob\" (Bobby) Jones", "", "Robert \"Bob\" (Bobby)", "Jones", "Bob", "",
             8}));

INSTANTIATE_TEST_SUITE_P(CommaOrder, NameShapeTest, testing::Values(
    NameCase{"Smith, John", "", "John", "Smith", "", "", 0},
    NameCase{"Smith, John Jr.", "", "John", "Smith", "", "Jr.", 0},
    NameCase{"Smith, John Paul,", "", "John Paul", "Smith", "", "", 0},
    NameCase{"Smith,John", "", "John", "Smith", "", "", 0},
    NameCase{"Smith, John, III", "", "John", "Smith", "", "III", 0},
    NameCase{"van Gogh, Vincent", "", "Vincent", "van Gogh", "", "", 0},
        // A comma left inside becomes a space: runs of spaces give empty words.
    NameCase{"Smith, John, Paul", "", "John  Paul", "Smith", "", "", 0},
    NameCase{"John Smith, Esq.", "", "John", "Smith", "", "Esq.", 0}));

INSTANTIATE_TEST_SUITE_P(Particles, NameShapeTest, testing::Values(
    NameCase{"Jan van der Berg", "", "Jan", "van der Berg", "", "", 0},
    NameCase{"Maria de la Cruz", "", "Maria", "de la Cruz", "", "", 0},
    NameCase{"Ludwig VAN Beethoven", "", "Ludwig", "VAN Beethoven", "", "", 0},
    NameCase{"Seán o' Casey", "", "Seán", "o' Casey", "", "", 0},
    NameCase{"Jeanne d' Arc", "", "Jeanne", "d' Arc", "", "", 0},
    NameCase{"Pieter in't Veld", "", "Pieter", "in't Veld", "", "", 0},
    NameCase{"John St. Clair", "", "John", "St. Clair", "", "", 0},
    // Particles up to the first word: all of it is family.
    NameCase{"de la Cruz", "", "", "de la Cruz", "", "", 0},
    NameCase{"Van Gogh", "", "", "Van Gogh", "", "", 0},
    // Only particles directly before the last word count.
    NameCase{"Carlos da Silva Santos", "", "Carlos da Silva", "Santos", "", "", 0}));

INSTANTIATE_TEST_SUITE_P(LastPartWords, NameShapeTest, testing::Values(
    NameCase{"Carlos Silva Filho", "", "Carlos", "Silva Filho", "", "", 0},
    NameCase{"Pedro Alves Neto", "", "Pedro", "Alves Neto", "", "", 0},
    NameCase{"João Costa NETTO", "", "João", "Costa NETTO", "", "", 0},
    NameCase{"José Santos Sobrinho", "", "José", "Santos Sobrinho", "", "", 0},
    NameCase{"Carlos da Silva Filho", "", "Carlos da", "Silva Filho", "", "", 0},
    NameCase{"Filho", "", "", "Filho", "", "", 0}));

// The first expression in list order wins, and the title stays in the given
// names.
INSTANTIATE_TEST_SUITE_P(Titles, NameShapeTest, testing::Values(
    NameCase{"Dr. John Smith", "Dr.", "Dr. John", "Smith", "", "", 4},
    NameCase{"dr john smith", "dr", "dr john", "smith", "", "", 4},
    NameCase{"Dr. Ing. Weber", "Dr.", "Dr. Ing.", "Weber", "", "", 4},
    NameCase{"Prof. Dr. Hans Müller", "Prof. Dr.", "Prof. Dr. Hans", "Müller", "", "", 4},
    NameCase{"Lieut. Col. James Hacker", "Lieut. Col.", "Lieut. Col. James", "Hacker", "", "",
             4},
    NameCase{"Brig. Gen. Smith", "Brig.", "Brig. Gen.", "Smith", "", "", 4},
    NameCase{"The Hon. Mr Justice Smith", "The Hon. Mr", "The Hon. Mr Justice", "Smith", "", "",
             4},
    NameCase{"Herr Hans Müller", "Herr", "Herr Hans", "Müller", "", "", 4},
    NameCase{"Mrs Jane Doe", "Mrs", "Mrs Jane", "Doe", "", "", 4},
    NameCase{"Sir Walter Raleigh", "Sir", "Sir Walter", "Raleigh", "", "", 4},
    // The last entry has no ending: no period, and "Cdrx" still counts.
    NameCase{"Wg Cdr Guy Gibson", "Wg Cdr", "Wg Cdr Guy", "Gibson", "", "", 4},
    NameCase{"Wg. Cdr. Guy Gibson", "Wg. Cdr", "Wg. Cdr. Guy", "Gibson", "", "", 4},
    NameCase{"Wg Cdrx Bloggs", "Wg Cdr", "Wg Cdrx", "Bloggs", "", "", 4},
    // A title needs a period or a word boundary after it.
    NameCase{"Drake Smith", "", "Drake", "Smith", "", "", 0},
    // Anchored at the very start of the untrimmed input.
    NameCase{" Dr. John Smith", "", "Dr. John", "Smith", "", "", 0},
    NameCase{"Dr.", "Dr.", "", "Dr.", "", "", 4}));

// Entries whose exact form decides: a required ending, an optional word
// that leaves the separator in the title, a compound listed before or after
// its short form.
INSTANTIATE_TEST_SUITE_P(TitleVocabulary, NameShapeTest, testing::Values(
    NameCase{"Madam Curie", "", "Madam", "Curie", "", "", 0},
    NameCase{"Madame Curie", "Madame", "Madame", "Curie", "", "", 4},
    NameCase{"First Lieut Smith", "", "First Lieut", "Smith", "", "", 0},
    NameCase{"First Lieutenant Smith", "First Lieutenant", "First Lieutenant", "Smith", "", "",
             4},
    NameCase{"Puan Aminah", "Puan ", "Puan", "Aminah", "", "", 4},
    NameCase{"Puan Sri Aminah", "Puan Sri", "Puan Sri", "Aminah", "", "", 4},
    NameCase{"Datuk Seri Najib", "Datuk", "Datuk Seri", "Najib", "", "", 4},
    NameCase{"Dott. sa Bianchi", "Dott. sa", "Dott. sa", "Bianchi", "", "", 4},
    NameCase{"Tan Sri Dato Ali", "Tan Sri Dato", "Tan Sri Dato", "Ali", "", "", 4},
    NameCase{"Rev. Dr. King", "Rev. Dr.", "Rev. Dr.", "King", "", "", 4},
    NameCase{"Contessa Rossi", "Contessa", "Contessa", "Rossi", "", "", 4},
    NameCase{"Sig.ra Rossi", "Sig.ra", "Sig.ra", "Rossi", "", "", 4},
    NameCase{"Dra. Ana Lopez", "Dra.", "Dra. Ana", "Lopez", "", "", 4},
    NameCase{"Hra Jansen", "Hra", "Hra", "Jansen", "", "", 4},
    // Initials that spell a title are one.
    NameCase{"M. R. James", "M. R.", "M. R.", "James", "", "", 4},
    NameCase{"Enrique Smith", "", "Enrique", "Smith", "", "", 0}));

// Suffixes are listed in vocabulary order, a numeral ending the name first.
INSTANTIATE_TEST_SUITE_P(Suffixes, NameShapeTest, testing::Values(
    NameCase{"John Smith Jr.", "", "John", "Smith", "", "Jr.", 0},
    NameCase{"John Smith jr", "", "John", "Smith", "", "jr", 0},
    NameCase{"Jane Doe PhD", "", "Jane", "Doe", "", "PhD", 0},
    NameCase{"Gregory House M.D.", "", "Gregory", "House", "", "M.D.", 0},
    NameCase{"John Smith PhD Jr.", "", "John", "Smith", "", "Jr. PhD", 0},
    NameCase{"John Smith Jr. III", "", "John", "Smith", "", "III Jr.", 0},
    NameCase{"Mary Jones RN", "", "Mary", "Jones", "", "RN", 0},
    // Once a suffix is present, every vocabulary word is cut from the text.
    NameCase{"Od Hansen Jr.", "", "", "Hansen", "", "Jr.", 0},
    // Not at a word end: no suffix.
    NameCase{"John Jrx Smith", "", "John Jrx", "Smith", "", "", 0}));

// The first numeral in list order that ends the name wins.
INSTANTIATE_TEST_SUITE_P(RomanNumerals, NameShapeTest, testing::Values(
    NameCase{"John Smith III", "", "John", "Smith", "", "III", 0},
    NameCase{"John Smith IIII", "", "John Smith", "IIII", "", "", 0},
    NameCase{"john smith iii", "", "john", "smith", "", "III", 0},
    NameCase{"Louis XIV", "", "", "Louis", "", "XIV", 0},
    NameCase{"Pope Pius XII", "", "Pope", "Pius", "", "XII", 0},
    NameCase{"John Smith,III", "", "John", "Smith", "", "III", 0},
    NameCase{"Jo V", "", "", "Jo", "", "V", 0},
    // Only a dropped comma trims: a tab left by the period-and-space trim
    // hides the numeral, and the word ends as the family.
    NameCase{"John Smith III\t", "", "John Smith", "III", "", "", 0},
    NameCase{"II", "", "", "II", "", "", 0}));

INSTANTIATE_TEST_SUITE_P(NickNames, NameShapeTest, testing::Values(
    NameCase{"Robert \"Bob\" /Jones/", "", "Robert \"Bob\"", "Jones", "Bob", "", 8},
    NameCase{"William \"Bill\" Clinton", "", "William \"Bill\"", "Clinton", "Bill", "", 8},
    NameCase{"Ann \"Annie\" \"Nan\" Lee", "", "Ann \"Annie\" \"Nan\"", "Lee", "Annie", "", 8},
    NameCase{"\"Bob\"", "", "", "\"Bob\"", "Bob", "", 8},
    NameCase{"John \"\" Smith", "", "John \"\"", "Smith", "", "", 0},
    NameCase{"Dr. \"Doc\" Brown", "Dr.", "Dr. \"Doc\"", "Brown", "Doc", "", 12}));

INSTANTIATE_TEST_SUITE_P(NonAscii, NameShapeTest, testing::Values(
    NameCase{"José García", "", "José", "García", "", "", 0},
    NameCase{"Ødegård, Kari", "", "Kari", "Ødegård", "", "", 0},
    NameCase{"Jürgen von Müller", "", "Jürgen", "von Müller", "", "", 0},
    NameCase{"Zoë /Ødegård/", "", "Zoë", "Ødegård", "", "", 0},
    NameCase{"Łukasz Żółć Jr.", "", "Łukasz", "Żółć", "", "Jr.", 0},
    NameCase{"Ἀλέξανδρος Παπαδόπουλος", "", "Ἀλέξανδρος", "Παπαδόπουλος", "", "", 0},
    // Words are split at ASCII spaces only.
    NameCase{"José\u00A0García", "", "", "José\u00A0García", "", "", 0},
    // \b is ASCII-only: a non-ASCII letter ends the title "Dr".
    NameCase{"Drœ Smith", "Dr", "Drœ", "Smith", "", "", 4}));

INSTANTIATE_TEST_SUITE_P(Hostile, NameShapeTest, testing::Values(
    NameCase{"/", "", "", "/", "", "", 0},
    NameCase{"//", "", "", "", "", "", 0},
    NameCase{"John /Smith", "", "John", "/Smith", "", "", 0},
    NameCase{"a/b/c/d", "", "ab", "c", "", "d", 0},
    NameCase{"John \"Smith", "", "John", "\"Smith", "", "", 0},
    NameCase{"John (Smith", "", "John", "(Smith", "", "", 0},
    NameCase{"John Smith)", "", "John", "Smith)", "", "", 0},
    NameCase{"John  Smith", "", "John", "Smith", "", "", 0},
    NameCase{",", "", "", "", "", "", 0},
    // Invalid UTF-8 matches no expression and ends as plain words.
    NameCase{"Jos\xC3 Garc\xFF" "a", "", "Jos\xC3", "Garc\xFF" "a", "", "", 0},
    NameCase{"Dr. \xFF Smith", "", "Dr. \xFF", "Smith", "", "", 0}));

TEST(KXDNameParserTest, EmptyInputKeepsThePreviousFields) {
  KXDNameParser parser;
  EXPECT_EQ(parser.parseName("Dr. \"Doc\" Brown Jr."), 12);
  for (const char* blank : {"", "   ", "\t\n", "\u00A0"}) {
    EXPECT_EQ(parser.parseName(blank), 2 | 4 | 8) << blank;
    EXPECT_EQ(parser.title(), "Dr.");
    EXPECT_EQ(parser.given(), "Dr. \"Doc\"");
    EXPECT_EQ(parser.family(), "Brown");
    EXPECT_EQ(parser.suffix(), "Jr.");
    EXPECT_EQ(parser.originalName(), "Dr. \"Doc\" Brown Jr.");
  }
}

TEST(KXDNameParserTest, FreshParserReportsAbsentFields) {
  KXDNameParser parser;
  EXPECT_EQ(parser.parseName(""), 50);
  EXPECT_EQ(parser.parseName("  "), 50);
  // A set field is present from then on, even when empty.
  parser.setFamily("");
  EXPECT_EQ(parser.parseName(""), 2 | 32);
  parser.setGiven("");
  EXPECT_EQ(parser.parseName(""), 2);

  KXDNameParser parsed;
  EXPECT_EQ(parsed.parseName("Plato"), 0);  // given is "" but present
  EXPECT_EQ(parsed.parseName(""), 2);
}

TEST(KXDNameParserTest, FullNameIsComposedNotStored) {
  KXDNameParser parser;
  EXPECT_EQ(parser.fullName(), "//");
  parser.parseName("Smith, John Jr.");
  EXPECT_EQ(parser.fullName(), "John /Smith/ Jr.");
  EXPECT_EQ(parser.originalName(), "Smith, John Jr.");
  parser.parseName("Plato");
  EXPECT_EQ(parser.fullName(), "/Plato/");
  parser.setFullName("stored text");
  parser.setGiven("Anna");
  parser.setFamily("Berg");
  parser.setSuffix("");
  EXPECT_EQ(parser.fullName(), "Anna /Berg/");
  EXPECT_EQ(parser.originalName(), "stored text");
}

TEST(KXDNameParserTest, ParseResetsEveryField) {
  KXDNameParser parser;
  parser.parseName("Dr. \"Doc\" Brown Jr.");
  parser.parseName("Plato");
  EXPECT_EQ(parser.title(), "");
  EXPECT_EQ(parser.nickName(), "");
  EXPECT_EQ(parser.suffix(), "");
  EXPECT_EQ(parser.given(), "");
  EXPECT_EQ(parser.family(), "Plato");
}

TEST(KXDNameParserTest, LocaleDecidesNumeralsAndParticles) {
  KXALocale::setCurrentLocaleIdentifier("tr_TR");
  KXDNameParser parser;
  // In Turkish "i" is not the lower case of "I".
  parser.parseName("JOHN SMITH iii");
  EXPECT_EQ(parser.suffix(), "");
  parser.parseName("JOHN SMITH ııı");
  EXPECT_EQ(parser.suffix(), "III");
  EXPECT_EQ(parser.family(), "SMITH");
  KXALocale::setCurrentLocaleIdentifier("");
  parser.parseName("JOHN SMITH iii");
  EXPECT_EQ(parser.suffix(), "III");
}

TEST(KXDNameParserVocabularyTest, TitlesKeepTheirOrderAndDuplicates) {
  EXPECT_EQ(kTitleFragments.front(), "Hr");
  EXPECT_EQ(kTitleFragments.back(), "Wg[\\. ]+Cdr");
  EXPECT_EQ(std::count(kTitleFragments.begin(), kTitleFragments.end(), "Hr"), 2);
  EXPECT_EQ(std::count(kTitleFragments.begin(), kTitleFragments.end(), "Brig(adier)?"), 2);
  const std::set<std::string_view> distinct(kTitleFragments.begin(), kTitleFragments.end());
  EXPECT_EQ(distinct.size(), kTitleFragments.size() - 2);
  const auto position = [](std::string_view fragment) {
    return std::find(kTitleFragments.begin(), kTitleFragments.end(), fragment) -
           kTitleFragments.begin();
  };
  EXPECT_LT(position("Dr"), position("Dr[\\. ]+Ing"));
  EXPECT_LT(position("Prof(essor)?[\\. ]+Dr"), position("Prof(essor)?"));
}

TEST(KXDNameParserVocabularyTest, ParticlesPullTheNextWordIntoTheFamily) {
  KXDNameParser parser;
  for (const char* particle :
       {"o'", "d'", "van", "von", "ver", "st.", "saint", "der", "de", "la", "del", "las", "te",
        "ten", "ter", "le", "du", "des", "da", "dos", "detto", "di", "dit", "in't", "lo", "'t",
        "tan", "uit", "den", "uyt", "vulgo", "VAN", "Saint", "DOS"}) {
    parser.parseName(std::string("Jan ") + particle + " Berg");
    EXPECT_EQ(parser.family(), std::string(particle) + " Berg") << particle;
    EXPECT_EQ(parser.given(), "Jan") << particle;
  }
  for (const char* word : {"y", "e", "zu", "af", "bin", "ibn", "dela", "d", "o", "t", "st"}) {
    parser.parseName(std::string("Jan ") + word + " Berg");
    EXPECT_EQ(parser.family(), "Berg") << word;
  }
}

TEST(KXDNameParserVocabularyTest, SuffixesAreFoundAsWritten) {
  KXDNameParser parser;
  // {ending, suffix}: the period is optional where the vocabulary says so.
  const std::pair<const char*, const char*> cases[] = {
      {"Jr", "Jr"},       {"Sr.", "Sr."},     {"PhD.", "PhD."},   {"M.D.", "M.D."},
      {"MD", "MD"},       {"M.D", "M.D"},     {"Esq", "Esq"},     {"CD", "CD"},
      {"CD.", "CD"},      {"CPA.", "CPA."},   {"JD", "JD"},       {"DC.", "DC."},
      {"DDS", "DDS"},     {"DMD.", "DMD."},   {"DVM", "DVM"},     {"OD.", "OD."},
      {"EdD", "EdD"},     {"PE.", "PE."},     {"MBA", "MBA"},     {"RN.", "RN."},
      {"TTEE", "TTEE"},   {"ttee.", "ttee."}, {"Jnr", ""},        {"MA", ""},
      {"Ed", ""},         {"DD", ""},         {"M D", ""}};
  for (const auto& [ending, suffix] : cases) {
    parser.parseName(std::string("Ann Lee ") + ending);
    EXPECT_EQ(parser.suffix(), suffix) << ending;
    if (*suffix != '\0') {
      EXPECT_EQ(parser.family(), "Lee") << ending;
    }
  }
}

// The parser tries only the titles that can start with the name's first
// letter, and settles "no suffix" with one combined search; both shortcuts
// must agree with trying every expression.
TEST(KXDNameParserShortcutTest, TitleIndexAgreesWithFullScan) {
  std::vector<std::string> names = {"",
                                    " Dr",
                                    "1st Lt",
                                    "\u212Ahun Ying Suda",  // Kelvin sign folds to k
                                    "\u017Fir Walter",      // long s folds to s
                                    "Ölmez",
                                    "\xFF" "Dr",
                                    "Grp Capt Smith",
                                    "group captain Smith",
                                    "SQUADRON LEADER Bader",
                                    "Cmdr Riker",
                                    "Sgt Pepper"};
  // Every fragment made literal: "[\. ]+" as one space, optional parts kept,
  // the first of each set of alternatives.
  std::vector<std::string> literals;
  for (std::string_view fragment : kTitleFragments) {
    std::string literal;
    for (std::size_t i = 0; i < fragment.size(); ++i) {
      const char c = fragment[i];
      if (fragment.substr(i, 6) == "[\\. ]+") {
        literal += ' ';
        i += 5;
      } else if (c == '(' || c == ')' || c == '?') {
        continue;
      } else if (c == '|') {
        while (i + 1 < fragment.size() && fragment[i + 1] != ')') ++i;
      } else {
        literal += c;
      }
    }
    literals.push_back(literal + " Smith");
    literals.push_back(literal + ". Smith");
  }
  for (const std::string& literal : literals) {
    EXPECT_GE(kxd_internal::firstTitleMatch(literal, false), 0) << literal;
    names.push_back(literal);
  }
  for (const std::string& name : names) {
    const std::int64_t full = kxd_internal::firstTitleMatch(name, false);
    EXPECT_EQ(kxd_internal::firstTitleMatch(name, true), full) << name;
  }
  EXPECT_EQ(kxd_internal::firstTitleMatch("Wg Cdr Smith", false), 156);
  EXPECT_EQ(kxd_internal::firstTitleMatch("Hr Smith", false), 0);
  EXPECT_EQ(kxd_internal::firstTitleMatch("\u212Ahun Ying Suda", true),
            std::find(kTitleFragments.begin(), kTitleFragments.end(), "Khun[\\. ]+Ying") -
                kTitleFragments.begin());
}

TEST(KXDNameParserShortcutTest, SuffixPrefilterAgreesWithFullScan) {
  for (const char* name :
       {"John Smith", "John Smith Jr.", "John Smith jr", "Jr. Smith", "A B PhD, MBA", "A M.D.",
        "A MD", "A M.DX", "A CD.", "A CDx", "A TTEE", "A Esq.\tB", "A\tJr", "A Jr\xFF",
        "A Sr.\nB", "A  DVM-", "Jane Doe, RN.", "A EdD.", "A Ed", "x\xFF Jr."}) {
    EXPECT_EQ(kxd_internal::knownSuffixesIn(name, true), kxd_internal::knownSuffixesIn(name, false))
        << name;
  }
  EXPECT_EQ(kxd_internal::knownSuffixesIn("A B PhD, MBA", true),
            (std::vector<std::string>{"PhD", "MBA"}));
}

TEST(KXDNameParserHostileTest, LongInputsFinish) {
  const std::vector<std::string> inputs = {
      std::string(200000, 'a'),
      [] { std::string s; for (int i = 0; i < 50000; ++i) s += "a/"; return s; }(),
      [] { std::string s; for (int i = 0; i < 50000; ++i) s += "(a"; return s; }(),
      [] { std::string s; for (int i = 0; i < 50000; ++i) s += "\\a"; return s; }(),
      [] { std::string s; for (int i = 0; i < 20000; ++i) s += "\n/x"; return s; }(),
      [] { std::string s; for (int i = 0; i < 20000; ++i) s += "\n(x"; return s; }(),
      [] { std::string s; for (int i = 0; i < 50000; ++i) s += "a \"b"; return s; }(),
      [] { std::string s; for (int i = 0; i < 50000; ++i) s += "de "; return s + "Cruz"; }(),
      [] { std::string s; for (int i = 0; i < 20000; ++i) s += "x Jr. "; return s; }(),
      [] { std::string s; for (int i = 0; i < 20000; ++i) s += "Dr. "; return s; }(),
      std::string(100000, ' ') + "x" + std::string(100000, ','),
  };
  KXDNameParser parser;
  for (const std::string& input : inputs) {
    parser.parseName(input);
    EXPECT_LE(parser.given().size() + parser.family().size(), input.size() + 1);
  }
  parser.parseName(inputs[7]);
  EXPECT_EQ(parser.family().size(), inputs[7].size());  // all particles: all family
}

TEST(KXDNameParserHostileTest, EveryByteAloneAndAroundANameIsSafe) {
  KXDNameParser parser;
  for (int byte = 0; byte < 256; ++byte) {
    const std::string b(1, static_cast<char>(byte));
    for (const std::string& input :
         {b, b + b, "John " + b + "Smith" + b, b + "Dr. John (Smith) Jr." + b}) {
      parser.parseName(input);
    }
  }
  SUCCEED();
}

TEST(KXDNameParserThreadTest, ParsersOnSeveralThreadsAgreeWithOne) {
  const std::vector<std::string> names = {
      "Dr. John Smith", "Smith, John Jr.", "Maria de la Cruz", "John (Johnny) Smith Jr.",
      "Robert \"Bob\" /Jones/", "Louis XIV", "Gregory House M.D.", "Pedro Alves Neto"};
  auto run = [&names] {
    std::vector<std::string> out;
    KXDNameParser parser;
    for (int round = 0; round < 200; ++round) {
      for (const std::string& name : names) {
        const auto outcome = parser.parseName(name);
        out.push_back(std::to_string(outcome) + "|" + parser.title() + "|" + parser.given() +
                      "|" + parser.family() + "|" + parser.nickName() + "|" + parser.suffix());
      }
    }
    return out;
  };
  const std::vector<std::string> expected = run();
  std::vector<std::vector<std::string>> results(4);
  std::vector<std::thread> threads;
  for (auto& result : results) threads.emplace_back([&result, &run] { result = run(); });
  for (auto& thread : threads) thread.join();
  for (const auto& result : results) EXPECT_EQ(result, expected);
}

}  // namespace
