// Hex and base64: boundary cases from the library's contract, and random round trips checked
// against OpenSSL's base64 encoder.
#include <gtest/gtest.h>

#include <openssl/evp.h>

#include <cstring>
#include <random>
#include <string>

#include "crypto/codec.h"
#include "support/openssl_oracle.h"

using namespace tessel;
using tessel::test::Bytes;

namespace {
Bytes bytesOf(const SecureBuffer& b) { return Bytes(b.data(), b.data() + b.size()); }
std::string textOf(const SecureBuffer& b) { return std::string(b.c_str(), b.size()); }
}  // namespace

TEST(Hex, EncodeIsUpperCaseHighNibbleFirst) {
  const Bytes in = {0x00, 0x01, 0xAB, 0xFF, 0x7E};
  EXPECT_EQ(textOf(hexEncode(in.data(), in.size())), "0001ABFF7E");
  EXPECT_EQ(textOf(hexEncodeLower(in.data(), in.size())), "0001abff7e");
  SecureBuffer empty = hexEncode(nullptr, 0);
  ASSERT_TRUE(empty);
  EXPECT_STREQ(empty.c_str(), "");
}

TEST(Hex, DecodeTable) {
  struct Case {
    const char* text;
    Bytes expected;
  } cases[] = {
      {"", {}},
      {"ABC", {0x0A, 0xBC}},            // odd length: a leading "0" is implied
      {"G1", {0x01}},                   // unknown characters count as 0
      {"abcdef", {0xAB, 0xCD, 0xEF}},   // lower case
      {"0a0B", {0x0A, 0x0B}},
      {"F", {0x0F}},
      {"zz", {0x00}},
      {"12 34", {0x01, 0x20, 0x34}},    // a space is just another unknown character here
  };
  for (const auto& c : cases) EXPECT_EQ(bytesOf(hexDecode(c.text)), c.expected) << c.text;
  EXPECT_FALSE(hexDecode(nullptr));
}

TEST(Hex, DecodeSkippingSpace) {
  EXPECT_EQ(bytesOf(hexDecodeSkippingSpace("12 34\n\tAB\r\v\fC")), (Bytes{0x01, 0x23, 0x4A, 0xBC}));
  EXPECT_EQ(bytesOf(hexDecodeSkippingSpace("  \n")), Bytes{});
  EXPECT_FALSE(hexDecodeSkippingSpace(nullptr));
}

TEST(Hex, StrictCheck) {
  EXPECT_TRUE(isHexText("0123456789abcdefABCDEF"));
  for (const char* bad : {"", "12G4", " 12", "0x12"}) EXPECT_FALSE(isHexText(bad)) << bad;
  EXPECT_FALSE(isHexText(nullptr));
}

TEST(Base64, PaddingCases) {
  struct Case {
    Bytes in;
    const char* text;
  } cases[] = {
      {{}, ""},
      {{0xFF}, "/w=="},
      {{0xFF, 0xFF}, "//8="},
      {{0xFF, 0xFF, 0xFF}, "////"},
      {{'f', 'o', 'o', 'b', 'a', 'r'}, "Zm9vYmFy"},  // RFC 4648 section 10
      {{'f', 'o', 'o', 'b'}, "Zm9vYg=="},
      {{'f', 'o', 'o', 'b', 'a'}, "Zm9vYmE="},
      {{0x00, 0x10, 0x83}, "ABCD"},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(textOf(base64Encode(c.in.data(), c.in.size())), c.text);
    EXPECT_EQ(bytesOf(base64Decode(c.text, std::strlen(c.text))), c.in) << c.text;
  }
}

TEST(Base64, DecodeRefusesMalformedText) {
  for (const char* bad : {"A", "AB", "ABC", "AB=C", "A===", "====", "Zm9v\nYmFy", "Zm9vYg=", "Zm9v YmFy",
                          "Zm9vYh==", "Zm9vYmF=", "*m9v", "Zg==Zg=="}) {
    EXPECT_FALSE(base64Decode(bad, std::strlen(bad))) << bad;
  }
  EXPECT_FALSE(base64Decode(nullptr, 0));
}

TEST(Base64, RandomRoundTripsAgreeWithOpenSsl) {
  std::mt19937 rng(20261122);
  for (int n = 0; n < 600; ++n) {
    Bytes in(static_cast<std::size_t>(n));
    for (auto& b : in) b = static_cast<std::uint8_t>(rng());
    SecureBuffer ours = base64Encode(in.data(), in.size());
    ASSERT_TRUE(ours);
    std::string theirs(4 * ((in.size() + 2) / 3) + 1, '\0');
    const int len = EVP_EncodeBlock(reinterpret_cast<unsigned char*>(&theirs[0]), in.data(), static_cast<int>(in.size()));
    theirs.resize(static_cast<std::size_t>(len));
    ASSERT_EQ(textOf(ours), theirs) << "length " << n;
    ASSERT_EQ(bytesOf(base64Decode(ours.c_str(), ours.size())), in);
    SecureBuffer hex = hexEncode(in.data(), in.size());
    ASSERT_EQ(bytesOf(hexDecode(hex.c_str())), in);
  }
}
