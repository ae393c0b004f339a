// Fuzzes the encryption dispatcher's text parsing: the salted-hash types 47, 48, 55, 59 and the
// key-hierarchy PIN type 68 (plus, for a share of the inputs, any type from -2 to 92), with
// fixed built-in moduli or a fuzzed modulus text, a fuzzed timestamp and a fuzzed text.
//
// Input (FuzzedDataProvider): a type selector, a key selector, a timestamp selector, the
// timestamp, a fuzzed modulus text when a key slot asks for one, then the text (up to its
// first NUL).
//
// Checks, for every input: the code is a row of the error table, and the result is present
// exactly when the code is 0. With built-in (or missing) moduli the code is predicted where
// the format decides it (missing timestamp 4, missing keys 1/2/3, malformed hashed or type-68
// text 18, well-formed text 0), and every envelope of the five main types is opened (the
// random source is the deterministic one of fuzz_support.h, so its RC4 key is known): strength
// letter, timestamp, ":", then the payload: the text itself or a 16/32-digit lower-case salted
// hash for 48/59, an RSA value of 2k upper-case hex digits for 47/55/68.
#include <fuzzer/FuzzedDataProvider.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include "output/dispatcher.h"
#include "crypto/error_table.h"
#include "crypto/moduli.h"
#include "crypto/rsa.h"
#include "fuzz_support.h"

namespace {

using tessel::SecureBuffer;

const std::string kSep = "::::::::::";

bool allOf(const std::string& s, std::size_t from, std::size_t n, bool (*pred)(char)) {
  if (from + n > s.size()) return false;
  for (std::size_t k = from; k < from + n; ++k)
    if (!pred(s[k])) return false;
  return true;
}
bool isHexChar(char c) {
  return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}
bool isDigitChar(char c) { return c >= '0' && c <= '9'; }

// Type 68, read by position: F, sep, 32 chars, sep, 32 chars, sep, at most 12 chars, no more sep.
bool type68Shape(const std::string& t) {
  if (t.size() < 95 || t.compare(1, 10, kSep) != 0 || t.compare(43, 10, kSep) != 0 ||
      t.compare(85, 10, kSep) != 0)
    return false;
  const std::string c = t.substr(95);
  return c.size() <= 12 && c.find(kSep) == std::string::npos;
}
bool type68Good(const std::string& t) {
  return type68Shape(t) && t[0] != ':' && allOf(t, 11, 32, isHexChar) && allOf(t, 53, 32, isHexChar) &&
         t.size() - 95 >= 4 && allOf(t, 95, t.size() - 95, isDigitChar);
}

bool validCode(tessel::ErrorCode code) {
  return code >= 0 && code <= 27 &&
         std::strcmp(tessel::errorMessage(code), "Error message does not exist!") != 0;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size > 4096) return 0;
  tessel_fuzz::installPatternRandom();
  FuzzedDataProvider in(data, size);

  static const int kMainTypes[] = {47, 48, 55, 59, 68};
  const std::uint8_t typeSelector = in.ConsumeIntegral<std::uint8_t>();
  const int type = (typeSelector % 8) < 5 ? kMainTypes[typeSelector % 8] : in.ConsumeIntegralInRange(-2, 92);
  const std::uint8_t keySelector = in.ConsumeIntegral<std::uint8_t>();
  const std::uint8_t tsSelector = in.ConsumeIntegral<std::uint8_t>();
  std::string timestamp = in.ConsumeRandomLengthString(64);
  timestamp.resize(std::strlen(timestamp.c_str()));
  const bool fuzzedKey = (keySelector & 3) == 3 || ((keySelector >> 2) & 3) == 3;
  const std::string fuzzedModulus = fuzzedKey ? in.ConsumeRandomLengthString(600) : std::string();
  std::string text = in.ConsumeRemainingBytesAsString();
  text.resize(std::strlen(text.c_str()));

  const char* appChoices[] = {tessel::builtinDefaultModulus(), tessel::builtinModulus(28, 1), nullptr,
                              fuzzedModulus.c_str()};
  const char* encChoices[] = {tessel::builtinModulus(0, 0), tessel::builtinModulus(46, 1), "",
                              fuzzedModulus.c_str()};
  const char* const keys[2] = {appChoices[keySelector & 3], encChoices[(keySelector >> 2) & 3]};
  const char* ts = (tsSelector & 7) == 0 ? nullptr : timestamp.c_str();

  SecureBuffer result;
  const tessel::ErrorCode code = tessel::encryptionDispatch(type, keys, &result, text.c_str(), ts);
  FUZZ_CHECK(validCode(code));
  FUZZ_CHECK(static_cast<bool>(result) == (code == tessel::kOk));

  const bool mainType = type == 47 || type == 48 || type == 55 || type == 59 || type == 68;
  if (fuzzedKey || !mainType) return 0;

  // Known keys: predict the code and open the envelope.
  const bool app = keys[0] != nullptr;
  const bool enc = keys[1] != nullptr && keys[1][0] != '\0';
  const bool needsEnc = type == 47 || type == 55 || type == 68;
  if (ts == nullptr) {
    FUZZ_CHECK(code == tessel::kErrTimestampMissing);
    return 0;
  }
  if (!app || (needsEnc && !enc)) {
    const int expected = !app ? (needsEnc && !enc ? tessel::kErrBothModuliMissing : tessel::kErrAppModulusMissing)
                              : tessel::kErrEncModulusMissing;
    FUZZ_CHECK(code == expected);
    return 0;
  }
  const std::size_t encBytes = needsEnc ? tessel::rsaModulusBytes(keys[1]) : 0;
  char mode = 0;
  if (type == 68) {
    if (!type68Shape(text)) FUZZ_CHECK(code == tessel::kErrTextFormat);
    if (type68Good(text)) FUZZ_CHECK(code == tessel::kOk);
  } else {
    const int shape = tessel_fuzz::hashedShape(text, &mode);
    int expected = shape < 0 ? tessel::kErrTextFormat : tessel::kOk;
    if (shape == 0 && needsEnc && (text.empty() || text.size() + 11 > encBytes)) expected = tessel::kErrPkcs1Padding;
    FUZZ_CHECK(code == expected);
  }
  if (code != tessel::kOk) return 0;

  const std::string inner =
      tessel_fuzz::openEnvelope(result.c_str(), result.size(), tessel::rsaModulusBytes(keys[0]), 512);
  FUZZ_CHECK(inner.size() >= timestamp.size() + 2);
  FUZZ_CHECK(tessel_fuzz::isStrengthLetter(inner[0]));
  FUZZ_CHECK(inner.compare(1, timestamp.size(), timestamp) == 0 && inner[1 + timestamp.size()] == ':');
  const std::string payload = inner.substr(timestamp.size() + 2);
  if (needsEnc) {
    FUZZ_CHECK(payload.size() == 2 * encBytes && tessel_fuzz::isHexOf(payload, true));
  } else if (mode == 0) {
    FUZZ_CHECK(payload == text);
  } else {
    FUZZ_CHECK(payload.size() == (mode == 'S' ? 16u : 32u) && tessel_fuzz::isHexOf(payload, false));
  }
  return 0;
}
