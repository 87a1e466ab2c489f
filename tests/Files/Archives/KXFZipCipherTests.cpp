#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "kxacore/Files/Archives/KXFZipCipher.h"

namespace {

std::vector<std::uint8_t> fromHex(const std::string& hex) {
  std::vector<std::uint8_t> bytes;
  for (std::size_t i = 0; i + 1 < hex.size(); i += 2) {
    bytes.push_back(static_cast<std::uint8_t>(std::stoul(hex.substr(i, 2), nullptr, 16)));
  }
  return bytes;
}

// Reference pair from Python's zipfile decrypter, an independent implementation.
TEST(KXFZipCipherTests, MatchesAnIndependentImplementation) {
  const auto cipherText = fromHex("000a141e28323c46505a646e78828c96");
  const auto plainText = fromHex("9f39dca0225fba2dc036e08a0a69ac6b");
  auto decrypted = cipherText;
  KXFZipCipher("genealogy").decrypt(decrypted);
  EXPECT_EQ(decrypted, plainText);
  auto encrypted = plainText;
  KXFZipCipher("genealogy").encrypt(encrypted);
  EXPECT_EQ(encrypted, cipherText);
}

TEST(KXFZipCipherTests, HeaderCarriesTheCheckByteAndRoundTripsInPieces) {
  KXFZipCipher writer("pw");
  auto header = writer.makeHeader(0xA7);
  std::vector<std::uint8_t> data(1000);
  for (std::size_t i = 0; i < data.size(); ++i) data[i] = static_cast<std::uint8_t>(i * 31);
  auto encrypted = data;
  writer.encrypt(encrypted);

  KXFZipCipher reader("pw");
  reader.decrypt(header);
  EXPECT_EQ(header.back(), 0xA7);
  // Decrypting in uneven pieces must equal decrypting whole: the state carries over.
  reader.decrypt(std::span(encrypted).first(3));
  reader.decrypt(std::span(encrypted).subspan(3));
  EXPECT_EQ(encrypted, data);

  auto wrong = writer.makeHeader(0xA7);
  KXFZipCipher("pW").decrypt(wrong);
  EXPECT_NE(std::vector<std::uint8_t>(wrong.begin(), wrong.end() - 1),
            std::vector<std::uint8_t>(header.begin(), header.end() - 1));
}

}  // namespace
