#include <cstdio>

#include "kxacore/Data/Dates/KXDDate.h"
#include "kxacore/RegExp/KXCRegExpPerl.h"

int main() {
  const auto sdn = KXDDate::sdnFromGregorianYear(2000, 1, 1);
  const auto expression = KXCRegExpPerl::regExpWithPattern("([0-9]+)/([0-9]+)");
  const bool matched = expression && expression->matchesString("1750/51");
  std::printf("consumer: SDN of 1 January 2000 = %lld, dual year matched = %s\n",
              static_cast<long long>(sdn), matched ? "yes" : "no");
  return sdn == 2451545 && matched ? 0 : 1;
}
