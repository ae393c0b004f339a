// Hex and base64: boundary cases from the library's contract, RFC 4648's examples, and random
// round trips checked against OpenSSL's base64 encoder.
#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>

#include "crypto/codec.h"
#include "support/openssl_oracle.h"

using namespace tessel;
using tessel::test::Bytes;

namespace {
Bytes bytesOf(const SecureBuffer& b) { return b ? Bytes(b.data(), b.data() + b.size()) : Bytes{0xBA, 0xD0}; }
std::string textOf(const SecureBuffer& b) { return b ? std::string(b.c_str(), b.size()) : "<absent>"; }
}  // namespace

TEST(Hex, EncodeDecodeAndStrictCheck) {
  const Bytes in = {0x00, 0x01, 0xAB, 0xFF, 0x7E};
  EXPECT_EQ(textOf(hexEncode(in.data(), in.size())), "0001ABFF7E");
  EXPECT_EQ(textOf(hexEncodeLower(in.data(), in.size())), "0001abff7e");
  EXPECT_EQ(textOf(hexEncode(nullptr, 0)), "");
  const std::pair<const char*, Bytes> decoded[] = {
      {"", {}},
      {"ABC", {0x0A, 0xBC}},           // odd length: a leading "0" is implied
      {"G1", {0x01}},                  // unknown characters count as 0
      {"abcdef", {0xAB, 0xCD, 0xEF}},  // lower case
      {"F", {0x0F}},
      {"12 34", {0x01, 0x20, 0x34}},  // a space is just another unknown character here
  };
  for (const auto& [text, bytes] : decoded) EXPECT_EQ(bytesOf(hexDecode(text)), bytes) << text;
  EXPECT_FALSE(hexDecode(nullptr));
  EXPECT_EQ(bytesOf(hexDecodeSkippingSpace("12 34\n\tAB\r\v\fC")), (Bytes{0x01, 0x23, 0x4A, 0xBC}));
  EXPECT_EQ(bytesOf(hexDecodeSkippingSpace("  \n")), Bytes{});
  EXPECT_FALSE(hexDecodeSkippingSpace(nullptr));
  EXPECT_TRUE(isHexText("0123456789abcdefABCDEF"));
  for (const char* bad : {"", "12G4", " 12", "0x12", static_cast<const char*>(nullptr)})
    EXPECT_FALSE(isHexText(bad)) << (bad ? bad : "null");
}

TEST(Base64, PaddingCasesAndRefusals) {
  const std::pair<Bytes, const char*> cases[] = {
      {{}, ""},
      {{'f', 'o', 'o', 'b', 'a', 'r'}, "Zm9vYmFy"},  // RFC 4648 section 10
      {{'f', 'o', 'o', 'b'}, "Zm9vYg=="},
      {{'f', 'o', 'o', 'b', 'a'}, "Zm9vYmE="},
      {{0x00, 0x10, 0x83}, "ABCD"},
  };
  for (const auto& [in, text] : cases) {
    EXPECT_EQ(textOf(base64Encode(in.data(), in.size())), text);
    EXPECT_EQ(bytesOf(base64Decode(text, std::strlen(text))), in) << text;
  }
  for (const char* bad : {"A", "AB", "ABC", "AB=C", "A===", "====", "Zm9v\nYmFy", "Zm9vYg=", "Zm9v YmFy",
                          "Zm9vYh==", "Zm9vYmF=", "*m9v", "Zg==Zg=="})
    EXPECT_FALSE(base64Decode(bad, std::strlen(bad))) << bad;
  EXPECT_FALSE(base64Decode(nullptr, 0));
}

TEST(Base64, RandomRoundTripsAgreeWithOpenSsl) {
  std::mt19937 rng(20261122);
  for (int n = 0; n < 600; ++n) {
    Bytes in(static_cast<std::size_t>(n));
    for (auto& b : in) b = static_cast<std::uint8_t>(rng());
    const SecureBuffer ours = base64Encode(in.data(), in.size());
    ASSERT_EQ(textOf(ours), test::opensslBase64(in)) << "length " << n;
    ASSERT_EQ(bytesOf(base64Decode(ours.c_str(), ours.size())), in);
    ASSERT_EQ(bytesOf(hexDecode(hexEncode(in.data(), in.size()).c_str())), in);
  }
}
