// Vocabularies of KXDNameParser, and two checks of its shortcuts. Not part
// of the library's interface: tests and fuzzers reach in here.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace kxd_internal {

// Known suffixes as expression fragments: ".?" is an optional period once
// every "." is escaped.
inline constexpr std::array<std::string_view, 18> kNameSuffixes{
    "Jr.?",  "Sr.?",  "PhD.?", "M.?D.?", "Esq.?", "CD",    "CPA.?", "JD.?",  "DC.?",
    "DDS.?", "DMD.?", "DVM.?", "OD.?",   "EdD.?", "PE.?",  "MBA.?", "RN.?",  "TTEE.?"};

// In this order: the first that ends a name wins.
inline constexpr std::array<std::string_view, 15> kRomanNumerals{
    "I", "II", "III", "IV", "V", "VI", "VII", "VIII", "IX", "X", "XI", "XII", "XIII", "XIV", "XV"};

// Words that pull the next word into the family name. The duplicates are
// harmless and kept as the list has always stood.
inline constexpr std::array<std::string_view, 35> kFamilyParticles{
    "o'",  "d'",  "van", "von",   "ver", "st.", "saint", "der", "de", "la",  "del", "las",
    "te",  "ten", "ter", "le",    "du",  "des", "da",    "dos", "da", "le",  "detto", "di",
    "dit", "du",  "in't", "lo",   "'t",  "te",  "tan",   "uit", "den", "uyt", "vulgo"};

// Portuguese generation words: with one of these last, the family has two words.
inline constexpr std::array<std::string_view, 4> kLastPartWords{"filho", "neto", "netto",
                                                                "sobrinho"};

// Title fragments, in matching order: the first expression that matches wins,
// so "Dr" before "Dr[\. ]+Ing" makes "Dr. Ing. Weber" a "Dr.". Each becomes
// "\A(?i)" + fragment + "(\.|\b)", except the last, which keeps no ending.
// "Hr" and "Brig(adier)?" stand twice.
inline constexpr std::array<std::string_view, 157> kTitleFragments{
    R"(Hr)", R"(A[\. ]+V[\. ]+M)", R"(Admiraal)", R"(Air[\. ]+Cdre)", R"(Air[\. ]+Commodore)",
    R"(Air[\. ]+Marshal)", R"(Air[\. ]+Vice[\. ]+Marshal)", R"(Alderman)", R"(Alhaji)",
    R"(Amb(assador)?)", R"(Baron(ess)?)", R"(Brig(adier)?)", R"(Brig(adier)?[\. ]+Gen(eral)?)",
    R"(Bro(ther)?)", R"(Canon)", R"(Cardinal)", R"(Chief)", R"(Cik)", R"(Col[\. ]+Dr)",
    R"(Commandant)", R"(Commissioner)", R"(Commodore)", R"(Comte)", R"(Comtessa)",
    R"(Congressman)", R"(Conseiller)", R"(Consul)", R"(Conte)", R"(Contessa)", R"(Corporal)",
    R"(Councillor)", R"(Count(ess)?)", R"(Crown[\. ]+Prince(ss)?)", R"(Dame)", R"(Datin)",
    R"(Dato)", R"(Datuk)", R"(Datuk[\. ]+Seri)", R"(Deacon(ess)?)", R"(Dean)", R"(Dhr)",
    R"(Dipl[\. ]+Ing)", R"(Doctor)", R"(Dott[\. ]+sa)", R"(Dott)", R"(Dr)", R"(Dr[\. ]+Ing)",
    R"(Dra)", R"(Drs)", R"(Embajador(a)?)", R"(En)", R"(Encik)", R"(Eng)", R"(Eur[\. ]+Ing)",
    R"(Exma[\. ]+Sra)", R"(Exmo[\. ]+Sr)", R"(F[\. ]+O)", R"(Father)",
    R"(First[\. ]+Lieut(enant))", R"(First[\. ]+Officer)", R"(Flt[\. ]+Lieut(enant))",
    R"(Flying[\. ]+Officer)", R"(Fr)", R"(Frau(lein)?)", R"(Fru)", R"(Gov(ernor)?)", R"(Graaf)",
    R"(Gravin)", R"((Grp|Group)[\. ]+(Capt|Captain))", R"(H[\. ]+E[\. ]+Dr)", R"(H[\. ]+H)",
    R"(H[\. ]+M)", R"(H[\. ]+R[\. ]+H)", R"(Hajah)", R"(Hajim?)",
    R"(Her[\. ]+(Highness|Majesty))", R"(Herr)", R"(High[\. ]+Chief)",
    R"(His[\. ]+(Highness|Holiness|Majesty))", R"(Hon(orable)?)", R"(Hr)", R"(Hra)", R"(Ing)",
    R"(Ir)", R"(Jonkheer)", R"(Judge)", R"(Justice)", R"(Khun[\. ]+Ying)", R"(Kolonel)",
    R"(Lady)", R"(Lcda)", R"(Lic)", R"(Lieut(enant)?[\. ]+(Cdr|Commander))",
    R"(Lieut(enant)?[\. ]+Col(onel)?)", R"(Lieut(enant)?[\. ]+Gen(eral)?)", R"(Lord)",
    R"(M[\. ]+(L|R))", R"(Madam(e|oiselle))", R"(Maj(or)?[\. ]+Gen(eral)?)", R"(Maj(or)?)",
    R"(Master)", R"(Mevrouw)", R"(Miss)", R"(Mlle)", R"(Mme)", R"(Monsieur)", R"(Monsignor)",
    R"(Mrs?)", R"(Ms)", R"(Mstr)", R"(Nti)", R"(Pastor)", R"(Pres(ident)?)",
    R"(Prince(ss|ssa)?)", R"(Prinses)", R"(Prof(essor)?[\. ]+Dr)", R"(Prof(essor)?[\. ]+Sir)",
    R"(Prof(essor)?)", R"(Puan[\. ]+(Sri)?)", R"(Rabbi)", R"(Rear[\. ]+Admiral)",
    R"(Rev(erend)?[\. ]+(Canon|Dr|Doctor|Mother))", R"(Rva)", R"(Sen(ator)?)",
    R"((Sgt|Sergeant))", R"(Sheikh(a)?)", R"(Sig[\. ]+(na|ra))", R"(Sig)", R"(Sister)",
    R"((Sqn|Squadron)[\. ]+(Ldr|Leader))", R"(Sr[\. ]+D)", R"(Sr)", R"(Sra)", R"(Srta)",
    R"(Sultan)", R"(Tan[\. ]+Sri([\. ]+Dato)?)", R"(Tengku)", R"(Teuku)", R"(Than[\. ]+Puying)",
    R"(The[\. ]+Hon(orable)?[\. ]+(Dr|Justice|Miss|Mr|Mrs|Ms|Sir))",
    R"(The[\. ]+Very[\. ]+Rev(erend)?)", R"(Toh[\. ]+Puan)", R"(Tun)", R"(Vice[\. ]+Admiral)",
    R"(Vice[\. ]+(Pres|President))", R"(Viscount(ess)?)", R"(Adm(iral)?)", R"(Brig(adier)?)",
    R"(Lieut(enant)?)", R"(Generaal)", R"(Gen(eral)?)", R"(Rev(erend)?)", R"((Cmdr|Commander))",
    R"(Capt(ain)?)", R"(Col(onel)?)", R"(Sir)", R"(Wg[\. ]+Cdr)",
};

// An entry dropped from a list would leave an empty one at its end, and an
// empty fragment or particle matches everything.
inline constexpr auto isEmptyEntry = [](std::string_view entry) { return entry.empty(); };
static_assert(std::ranges::none_of(kNameSuffixes, isEmptyEntry));
static_assert(std::ranges::none_of(kRomanNumerals, isEmptyEntry));
static_assert(std::ranges::none_of(kFamilyParticles, isEmptyEntry));
static_assert(std::ranges::none_of(kLastPartWords, isEmptyEntry));
static_assert(std::ranges::none_of(kTitleFragments, isEmptyEntry));

// Index of the first title expression that matches `name`, or -1. With
// `byInitial` only the expressions that can start with the name's first
// letter are tried (what the parser does); without, all of them in order.
[[nodiscard]] std::int64_t firstTitleMatch(std::string_view name, bool byInitial);

// The suffixes the per-suffix expressions find in `name`, as written. With
// `prefiltered` one combined search decides first whether any can match
// (what the parser does).
[[nodiscard]] std::vector<std::string> knownSuffixesIn(std::string_view name, bool prefiltered);

}  // namespace kxd_internal
