// Error table texts and the wipe primitive. (The random source is driven in dispatch_envelope_test,
// freed memory scanned for what wiping should have removed in hygiene_test.)
#include <gtest/gtest.h>

#include <utility>
#include <vector>

#include "crypto/error_table.h"
#include "crypto/wipe.h"

using namespace tessel;

TEST(ErrorTable, ExactMessages) {
  // The texts are matched on by app developers: they are kept verbatim, misspellings included.
  const char* const kMissing = "Error message does not exist!";
  const std::pair<int, const char*> rows[] = {
      {0, "No Error!"},
      {1, "The application platform modulus is missing!"},
      {2, "The encryption platform modulus is missing!"},
      {3, "Both the application platform modulus and the encryption platform modulus are missing!"},
      {4, "The timestamp is missing!"},
      {5, "The text is missing!"},
      {6, "The ciphered text is missing!"},
      {7, "Encyption failed!"},
      {8, "The encryption type (or bank id) is unknown!"},
      {9, "Generating random number failed!"},
      {10, "Converting password to ansi x9.8 pin blok failed!"},
      {11, "Allocating memory failed!"},
      {12, "Adding PKCS1 padding failed!"},
      {13, "Adding Keyou padding failed!"},
      {14, "Base64 encoding failed!"},
      {15, "Base64 decoding failed!"},
      {16, "Converting hexdecimal string to binary failed!"},
      {17, "Converting binary to hexdecimal string failed!"},
      {18, "The format of the text is wrong!"},
      {19, "Adding SDHS padding failed!"},
      {20, "Decyption failed!"},
      {21, "The parameters is invalid!"},
      {22, "The context is invalid!"},
      {23, "The sm2 public key is invalid!"},
      {24, "The sm2 private key is invalid!"},
      {25, "The signature verification failed!"},
      {26, kMissing}, {27, "The interface is not implemented!"}, {28, kMissing}, {40, kMissing}, {-1, kMissing},
  };
  for (const auto& [code, text] : rows) EXPECT_STREQ(errorMessage(code), text) << code;
  // The session's last-error codes: the table above, then the PIN-code codes from 100.
  const std::pair<int, const char*> session[] = {
      {0, "No Error!"}, {7, "Encyption failed!"}, {99, kMissing}, {100, "Challenge code is empty"},
      {101, "Encryption error"}, {102, "Failed to apply for space"}, {104, "Unknown error"},
      {127, "Unknown error"}, {-128, kMissing}};
  for (const auto& [code, text] : session) EXPECT_STREQ(lastErrorText(code), text) << code;
  EXPECT_STRNE(lastErrorText(103), "Unknown error");
}

TEST(Wipe, ZeroesExactlyTheRange) {
  for (std::size_t n : {0, 1, 7, 8, 9, 300}) {
    std::vector<unsigned char> buf(n + 2, 0xA5), expected(n + 2, 0);
    expected.front() = expected.back() = 0xA5;
    secureWipe(buf.data() + 1, n);
    ASSERT_EQ(buf, expected) << n;
  }
  secureWipe(nullptr, 0);
}
