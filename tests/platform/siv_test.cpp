// The yardstick of the cipher's tests, measured against the RFC's own vectors.

#include "tests/platform/siv.h"

#include <gtest/gtest.h>
#include <nettle/siv-cmac.h>

#include <cstdint>

namespace {

std::string fromHex(const std::string& hex) {
  std::string bytes;
  for (std::size_t i = 0; i < hex.size(); i += 2) {
    bytes += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
  }
  return bytes;
}

const std::uint8_t* in(const std::string& text) {
  return reinterpret_cast<const std::uint8_t*>(text.data());
}

TEST(SivTest, FirstVectorOfTheRfc) {
  const std::string sealed =
      siv::seal(fromHex("fffefdfcfbfaf9f8f7f6f5f4f3f2f1f0f0f1f2f3f4f5f6f7f8f9fafbfcfdfeff"),
                {fromHex("101112131415161718191a1b1c1d1e1f2021222324252627")},
                fromHex("112233445566778899aabbccddee"));
  EXPECT_EQ(sealed, fromHex("85632d07c6e8f37f950acd320a2ecc9340c02b9690c4dc04daef7f6afe5c"));
}

TEST(SivTest, SecondVectorOfTheRfc) {
  const std::string sealed = siv::seal(
      fromHex("7f7e7d7c7b7a79787776757473727170404142434445464748494a4b4c4d4e4f"),
      {fromHex("00112233445566778899aabbccddeeffdeaddadadeaddadaffeeddccbbaa99887766554433221100"),
       fromHex("102030405060708090a0"), fromHex("09f911029d74e35bd84156c5635688c0")},
      fromHex("7468697320697320736f6d6520706c61696e7465787420746f20656e6372797074207573696e672053"
              "49562d414553"));
  EXPECT_EQ(sealed, fromHex("7bdb6e3b432667eb06f4d14bff2fbd0fcb900f2fddbe404326601965c889bf17"
                            "dba77ceb094fa663b7a3f748ba8af829ea64ad544a272e9c485b62a3fd5c0d"));
}

// Its expected bytes were put together from OpenSSL's CMAC and counter mode.
TEST(SivTest, LongKeysGiveWhatOpenSslGives) {
  const std::string sealed =
      siv::seal(fromHex("fffefdfcfbfaf9f8f7f6f5f4f3f2f1f06f6e6d6c6b6a69686766656463626160"
                        "f0f1f2f3f4f5f6f7f8f9fafbfcfdfeff000102030405060708090a0b0c0d0e0f"),
                {fromHex("101112131415161718191a1b1c1d1e1f2021222324252627")},
                fromHex("112233445566778899aabbccddee"));
  EXPECT_EQ(sealed, fromHex("f125274c598065cfc26b0e71575029088b035217e380cac8919ee800c126"));
}

TEST(SivTest, PrimitiveOfTheCipherGivesTheSameForEveryLength) {
  const std::string key(64, 'k');
  siv_cmac_aes256_ctx context{};
  siv_cmac_aes256_set_key(&context, in(key));
  for (std::size_t length = 0; length <= 100; ++length) {
    const std::string plain(length, 'p');
    std::string sealed(length + SIV_DIGEST_SIZE, '\0');
    siv_cmac_aes256_encrypt_message(&context, 5, in("nonce"), 6, in("header"), sealed.size(),
                                    reinterpret_cast<std::uint8_t*>(sealed.data()), in(plain));
    EXPECT_EQ(sealed, siv::seal(key, {"header", "nonce"}, plain)) << length;
  }
}

}  // namespace
