// Every encryption type 0..90 through encryptionDispatch, opened by the server side (OpenSSL):
// strength letter, timestamp and content checked against values worked out independently;
// the error codes of the check order and of every helper step.
#include <gtest/gtest.h>

#include <cctype>
#include <cstring>
#include <set>
#include <string>

#include "crypto/dispatch_payloads.h"
#include "crypto/dispatcher.h"
#include "crypto/random.h"
#include "server/envelope.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

using server::Inner;
using server::Outer;

const char kTimestamp[] = "1700000000";

std::string upper(std::string s) {
  for (char& c : s) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return s;
}

struct Dispatched {
  int code = -1;
  bool present = false;
  std::string output;
};

Dispatched dispatch(int type, const char* app, const char* enc, const char* text, const char* timestamp,
                    bool withResult = true) {
  const char* const keys[2] = {app, enc};
  SecureBuffer out = SecureBuffer::copyOfText("stale");
  Dispatched d;
  d.code = encryptionDispatch(type, keys, withResult ? &out : nullptr, text, timestamp);
  d.present = static_cast<bool>(out);
  if (out) d.output.assign(out.c_str(), out.size());
  return d;
}

class DispatchTypes : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    app_ = appKey().modulusHex();
    enc_ = encKey().modulusHex();
  }
  static server::OpenKeys keys(const std::string& pinKey = std::string()) {
    server::OpenKeys k;
    k.app = &appKey();
    k.enc = &encKey();
    k.pinKey = pinKey;
    return k;
  }
  // Dispatches with both keys and a timestamp and opens the result on the server side.
  static server::Opened roundTrip(int type, const std::string& text, const std::string& pinKey = std::string()) {
    const Dispatched d = dispatch(type, app_.c_str(), enc_.c_str(), text.c_str(), kTimestamp);
    EXPECT_EQ(d.code, 0) << "type " << type << " text '" << text << "'";
    server::Opened opened;
    std::string error;
    EXPECT_TRUE(server::openOutput(type, d.output, keys(pinKey), &opened, &error))
        << "type " << type << " text '" << text << "': " << error;
    return opened;
  }
  static std::string app_, enc_;
};
std::string DispatchTypes::app_, DispatchTypes::enc_;

// The strength ratings by rule set (= encryption type), as the rating table assigns them.
enum Rating { kGeneral, kNumeric, kStrictNumeric, kLettersRequired, kDefault };
Rating ratingOf(int type) {
  static const std::set<int> general = {1,  2,  3,  5,  7,  8,  9,  10, 11, 12, 16, 18, 23, 24, 26, 27,
                                        28, 29, 30, 32, 33, 36, 37, 38, 39, 40, 41, 42, 43, 44, 45, 46,
                                        49, 50, 51, 52, 53, 54, 55, 58, 59, 60, 61, 62, 63, 64, 66, 67,
                                        68, 70, 71, 72, 73, 74, 75, 80, 81, 82, 85, 86, 87, 89, 90};
  static const std::set<int> numeric = {4, 14, 17, 19, 20, 25, 31, 35, 47, 48, 57, 84};
  if (general.count(type)) return kGeneral;
  if (numeric.count(type)) return kNumeric;
  if (type == 34) return kStrictNumeric;
  if (type == 6) return kLettersRequired;
  return kDefault;
}

// Four texts and the letter each rating gives them, worked out by hand from the rating rules:
// "Kqhzmw" mixed-case letters without runs, "abcdef" one ascending run, "Password" eight mixed-case
// letters, "123456" an ascending digit run.
const char* const kTexts[] = {"Kqhzmw", "abcdef", "Password", "123456"};
const char kLetters[5][4] = {
    {'S', 'W', 'S', 'W'},  // general
    {'W', 'W', 'W', 'W'},  // numeric-aware
    {'W', 'W', 'W', 'T'},  // strict numeric-aware
    {'W', 'W', 'S', 'W'},  // letters required
    {'S', 'M', 'S', 'W'},  // default
};

TEST_F(DispatchTypes, EveryTypeOpensOnTheServer) {
  int opened = 0, refused = 0;
  for (int type = 0; type <= 90; ++type) {
    const server::TypeLayout layout = server::typeLayout(type);
    if (layout.outer == Outer::Unknown) {
      EXPECT_EQ(dispatch(type, app_.c_str(), enc_.c_str(), "Kqhzmw", kTimestamp).code, 8) << type;
      ++refused;
      continue;
    }
    // Their texts have a layout of their own: see the dedicated tests below.
    if (layout.inner == Inner::Type38 || layout.inner == Inner::Type68 || layout.inner == Inner::Hashed ||
        layout.inner == Inner::HashedRsa)
      continue;
    for (int t = 0; t < 4; ++t) {
      SCOPED_TRACE("type " + std::to_string(type) + " text " + kTexts[t]);
      const server::Opened out = roundTrip(type, kTexts[t]);
      ASSERT_TRUE(out.contentOpened);
      EXPECT_EQ(out.content, layout.inner == Inner::Type5 ? upper(toHex(opensslSha1(kTexts[t]))) : kTexts[t]);
      if (layout.outer == Outer::WrappedEnvelope) {
        EXPECT_TRUE(out.wrapped);
        EXPECT_EQ(out.strength, kLetters[ratingOf(type)][t]);
        EXPECT_EQ(out.timestamp, kTimestamp);
      } else {
        EXPECT_FALSE(out.wrapped);
      }
      if (layout.inner == Inner::PairPkcs1Hex || layout.inner == Inner::PairPkcs1Base64) {
        EXPECT_EQ(out.timestamp, kTimestamp);
      }
    }
    ++opened;
  }
  EXPECT_EQ(refused, 8);        // 21, 65, 69, 76, 77, 78, 79, 83
  EXPECT_EQ(opened, 91 - 8 - 6);  // less 38, 68, 47, 48, 55, 59
}

TEST_F(DispatchTypes, EmptyTextLetters) {
  struct Case {
    int type;
    char letter;
  };
  // The empty text is 'E' except under the letters-required and default ratings.
  for (const Case c : {Case{48, 'E'}, Case{1, 'E'}, Case{6, 'W'}, Case{0, 'W'}, Case{34, 'E'}}) {
    const server::Opened out = roundTrip(c.type, "");
    EXPECT_EQ(out.strength, c.letter) << c.type;
    EXPECT_EQ(out.payload, "") << c.type;
  }
}

TEST_F(DispatchTypes, LongTextsKeepTheirLengthFields) {
  // 100 bytes and more: "%02d" widens to three digits in the type 19 block and the heap pair.
  const std::string text(120, 'q');
  EXPECT_EQ(roundTrip(19, text).content, text);
  EXPECT_EQ(roundTrip(22, text).content, text);
  EXPECT_EQ(roundTrip(0, std::string(4000, 'x')).content, std::string(4000, 'x'));
}

TEST_F(DispatchTypes, Type38IsATripleDesPinBlockUnderAnRsaWrappedKey) {
  for (const char* pin : {"123456", "", "000000000000", "9"}) {
    const Dispatched d = dispatch(38, app_.c_str(), enc_.c_str(), pin, kTimestamp);
    ASSERT_EQ(d.code, 0) << pin;
    std::string content, error;
    ASSERT_TRUE(server::openEnvelope(d.output, appKey(), 512, &content, &error)) << error;
    server::Wrapped w;
    ASSERT_TRUE(server::splitWrapped(content, &w, &error));
    ASSERT_GT(w.payload.size(), 16u);
    // Open by hand with OpenSSL: the DER value, then DES-EDE over the 8-byte block.
    std::string der;
    ASSERT_TRUE(server::openPkcs1Hex(encKey(), w.payload.substr(16), &der, &error)) << error;
    ASSERT_EQ(der.size(), 30u);
    EXPECT_EQ(toHex(bytesOf(der.substr(0, 4))), "301c0410");
    EXPECT_EQ(toHex(bytesOf(der.substr(20))), "04089999999999999999");
    const Bytes key = bytesOf(der.substr(4, 16));
    for (std::uint8_t b : key) EXPECT_EQ(__builtin_popcount(b) % 2, 1) << "key parity";
    const Bytes plain = opensslDesEde(key, fromHex(w.payload.substr(0, 16)), false);
    std::string expected = std::string(pin) + std::string(16 - std::strlen(pin), 'f');
    EXPECT_EQ(toHex(plain), expected);
    std::string opened;
    ASSERT_TRUE(server::openType38(encKey(), w.payload, &opened, &error)) << error;
    EXPECT_EQ(opened, pin);
  }
  EXPECT_EQ(roundTrip(38, "123456").strength, 'W');  // all digits with a run, general rating
  EXPECT_EQ(roundTrip(38, "739182").strength, 'M');  // all digits, no runs
}

// The type 68 text for PIN `c`: A and B are the working and PIN keys wrapped the way the issuer
// wraps them (triple-DES ECB encryption under the parent key), with OpenSSL.
struct Type68Text {
  std::string text;
  std::string pinKey;
};
Type68Text type68Text(char selector, const std::string& c, const Bytes& master) {
  const Bytes working = fromHex("3b1f6a0c9d2e4f5871a6c3e5d7092b4f");
  const Bytes pinKey = fromHex("c4d5e6f708192a3b4c5d6e7f80912233");
  const std::string sep = "::::::::::";
  Type68Text t;
  t.text = std::string(1, selector) + sep + upper(toHex(opensslDesEde(master, working, true))) + sep +
           upper(toHex(opensslDesEde(working, pinKey, true))) + sep + c;
  t.pinKey = std::string(pinKey.begin(), pinKey.end());
  return t;
}

Bytes configuredMasterKey(char selector) {
  SecureBuffer key;
  EXPECT_EQ(masterPinKey(selector, &key), 0);
  return Bytes(key.data(), key.data() + key.size());
}

TEST_F(DispatchTypes, Type68OpensWithTheDerivedPinKey) {
  for (char selector : {'1', '0', 'x'}) {
    const Bytes master = configuredMasterKey(selector);
    ASSERT_EQ(master.size(), 16u);
    const Type68Text t = type68Text(selector, "739182", master);
    const server::Opened out = roundTrip(68, t.text, t.pinKey);
    EXPECT_EQ(out.content, "739182") << selector;
    EXPECT_EQ(out.strength, 'M') << "rated over the PIN field only";
    EXPECT_EQ(out.timestamp, kTimestamp);
  }
  EXPECT_NE(configuredMasterKey('0'), configuredMasterKey('1'));
  // Text made for the other master key: the device derives another PIN key, so the PIN block
  // does not open under the issuer's.
  const Type68Text wrong = type68Text('0', "739182", configuredMasterKey('1'));
  const Dispatched d = dispatch(68, app_.c_str(), enc_.c_str(), wrong.text.c_str(), kTimestamp);
  ASSERT_EQ(d.code, 0);
  server::Opened opened;
  std::string error;
  EXPECT_FALSE(server::openOutput(68, d.output, keys(wrong.pinKey), &opened, &error) &&
               opened.content == "739182");
}

TEST_F(DispatchTypes, Type68RefusesMalformedTexts) {
  const Type68Text t = type68Text('1', "1234", configuredMasterKey('1'));
  const std::string s = t.text;  // F(1) sep(10) A(32) sep(10) B(32) sep(10) C
  struct Case {
    const char* name;
    std::string text;
    int code;
  };
  const Case cases[] = {
      {"good", s, 0},
      {"no F", s.substr(1), 18},
      {"A short", s.substr(0, 11) + s.substr(12), 18},
      {"A long", s.substr(0, 11) + "0" + s.substr(11), 18},
      {"B short", s.substr(0, 53) + s.substr(54), 18},
      {"no third separator", s.substr(0, 85), 18},
      {"C too long", s + "123456789", 18},
      {"separator in C", s.substr(0, 95) + "::::::::::", 18},
      {"empty", "", 18},
      {"A not hex", s.substr(0, 11) + "G" + s.substr(12), 16},
      {"C too short for a PIN block", s.substr(0, 95) + "123", 10},
      {"C with a letter", s.substr(0, 95) + "12a4", 10},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(dispatch(68, app_.c_str(), enc_.c_str(), c.text.c_str(), kTimestamp).code, c.code) << c.name;
  }
}

TEST_F(DispatchTypes, HashedTypesCarryTheSaltedMd5) {
  const std::string sep = "::::::::::";
  // "Kqhzmw7": 'M' under the numeric-aware rating (47, 48), 'S' under the general one (55, 59);
  // the whole text would rate 'S' under both.
  for (int type : {47, 48, 55, 59}) {
    for (char mode : {'S', 'F'}) {
      const std::string text = "Kqhzmw7" + sep + "s4lt:x" + sep + mode;
      const server::Opened out = roundTrip(type, text);
      EXPECT_EQ(out.content, expectedSaltedHash("Kqhzmw7", "s4lt:x", mode)) << type << mode;
      EXPECT_EQ(out.strength, (type == 47 || type == 48) ? 'M' : 'S') << type;
      if (type == 48 || type == 59) {
        EXPECT_EQ(out.payload, out.content);
      }
    }
    // No separator: the text itself is the value.
    const server::Opened plain = roundTrip(type, "Kqhzmw7");
    EXPECT_EQ(plain.content, "Kqhzmw7");
  }
  EXPECT_EQ(roundTrip(47, "pw" + sep + "salt" + sep + "S").content, "c359e5975c5a3f45");
}

TEST_F(DispatchTypes, HashedTypesRefuseMalformedSalts) {
  const std::string sep = "::::::::::";
  struct Case {
    const char* name;
    std::string text;
    int code;
  };
  const Case cases[] = {
      {"empty password", sep + "salt" + sep + "S", 18},
      {"nothing after the separator but 11 characters", "pw" + sep + "abcdefghijk", 18},
      {"empty salt", "pw" + sep + sep + "S", 18},
      {"no second separator", "pw" + sep + "salt", 18},
      {"unknown mode", "pw" + sep + "salt" + sep + "X", 18},
      {"one-character salt", "pw" + sep + "s" + sep + "F", 0},
  };
  for (int type : {47, 48, 55, 59}) {
    for (const Case& c : cases) {
      EXPECT_EQ(dispatch(type, app_.c_str(), enc_.c_str(), c.text.c_str(), kTimestamp).code, c.code)
          << type << ": " << c.name;
    }
  }
}

TEST_F(DispatchTypes, CommandLineOpensDeviceOutputs) {
  const std::string sep = "::::::::::";
  const std::string appPem = dataPath("dispatch_app_key_1024.pem"), encPem = dataPath("dispatch_enc_key_2048.pem");
  const std::string hashedText = "Kqhzmw7" + sep + "s4lt" + sep + "S";
  Dispatched d = dispatch(47, app_.c_str(), enc_.c_str(), hashedText.c_str(), kTimestamp);
  ASSERT_EQ(d.code, 0);
  CliRun run = runOpenCli({"--type", "47", "--key", appPem, "--enc-key", encPem, "--password", "Kqhzmw7", "--salt",
                           "s4lt", "--mode", "S", d.output});
  EXPECT_EQ(run.status, 0) << run.err;
  EXPECT_NE(run.out.find("strength: M\ntimestamp: 1700000000\n"), std::string::npos) << run.out;
  EXPECT_NE(run.out.find("password: match"), std::string::npos) << run.out;

  d = dispatch(5, app_.c_str(), enc_.c_str(), "Kqhzmw7", kTimestamp);
  run = runOpenCli({"--type", "5", "--key", appPem, "--enc-key", encPem, "--password", "Kqhzmw7", d.output});
  EXPECT_EQ(run.status, 0) << run.err;

  const Bytes master = configuredMasterKey('7');
  const Type68Text t = type68Text('7', "739182", master);
  d = dispatch(68, app_.c_str(), enc_.c_str(), t.text.c_str(), kTimestamp);
  ASSERT_EQ(d.code, 0);
  run = runOpenCli({"--type", "68", "--key", appPem, "--enc-key", encPem, "--master-key", toHex(master),
                    "--wrapped-working-key", t.text.substr(11, 32), "--wrapped-pin-key", t.text.substr(53, 32), d.output});
  EXPECT_EQ(run.status, 0) << run.err;
  EXPECT_NE(run.out.find("content: 739182\n"), std::string::npos) << run.out;
  run = runOpenCli({"--type", "68", "--key", appPem, "--enc-key", encPem, "--pin-key", toHex(bytesOf(t.pinKey)),
                    d.output});
  EXPECT_NE(run.out.find("content: 739182\n"), std::string::npos) << run.out;
  // The envelope under the wrong application key: one line, non-zero.
  run = runOpenCli({"--type", "68", "--key", dataPath("dispatch_foreign_key_1024.pem"), d.output});
  EXPECT_EQ(run.status, 1);
  EXPECT_EQ(run.err.find('\n'), run.err.size() - 1);
}

// ---- error codes

TEST_F(DispatchTypes, ChecksComeInTheirOrder) {
  const char* a = app_.c_str();
  const char* e = enc_.c_str();
  static const std::string k245(245, 'x'), k246(246, 'x'), k254(254, 'x'), k255(255, 'x');
  // 1021 bits: k = 128, but a "Keyou" block starts with an ASCII digit (0x30 and up), above it.
  static const std::string lowTopModulus = "1F" + std::string(254, 'F');
  struct Case {
    const char* name;
    int type;
    const char *app, *enc, *text, *timestamp;
    bool result;
    int code;
  };
  const Case cases[] = {
      {"type 3 needs no timestamp", 3, a, e, "pw", nullptr, true, 0},
      {"type 4 needs one", 4, a, e, "pw", nullptr, true, 4},
      {"timestamp before text", 0, a, e, nullptr, nullptr, true, 4},
      {"timestamp before type", 65, a, e, "pw", nullptr, true, 8},
      {"text before result", 0, a, e, nullptr, kTimestamp, false, 5},
      {"result", 0, a, e, "pw", kTimestamp, false, 6},
      {"text before unknown type", 91, a, e, nullptr, kTimestamp, true, 5},
      {"type 91", 91, a, e, "pw", kTimestamp, true, 8},
      {"type 91 without timestamp", 91, a, e, "pw", nullptr, true, 8},
      {"type 65", 65, a, e, "pw", kTimestamp, true, 8},
      {"negative type", -1, a, e, "pw", kTimestamp, true, 8},
      {"unknown type without keys", 21, nullptr, nullptr, "pw", kTimestamp, true, 8},
      {"type before keys", 91, nullptr, nullptr, "pw", kTimestamp, true, 8},
      {"App: no keys", 0, nullptr, nullptr, "pw", kTimestamp, true, 1},
      {"App: empty key text", 0, "", e, "pw", kTimestamp, true, 1},
      {"Both: no keys", 2, nullptr, nullptr, "pw", kTimestamp, true, 3},
      {"Both: no application key", 2, nullptr, e, "pw", kTimestamp, true, 1},
      {"Both: no encryption key", 2, a, nullptr, "pw", kTimestamp, true, 2},
      {"Enc: no keys", 3, nullptr, nullptr, "pw", kTimestamp, true, 2},
      {"Enc: application key only", 30, a, nullptr, "pw", kTimestamp, true, 2},
      {"type 56 is App", 56, nullptr, e, "pw", kTimestamp, true, 1},
      {"type 88 is App", 88, nullptr, nullptr, "pw", nullptr, true, 1},
      {"keys before text format", 38, nullptr, e, "1234567890123", kTimestamp, true, 1},
      {"type 38 with 13 digits", 38, a, e, "1234567890123", kTimestamp, true, 5},
      {"type 38 with a letter", 38, a, e, "12a4", kTimestamp, true, 5},
      {"PKCS#1 refuses an empty text", 30, a, e, "", kTimestamp, true, 12},
      {"Keyou refuses an empty text", 29, a, e, "", kTimestamp, true, 13},
      {"PKCS#1 takes 245 bytes for 2048 bits", 30, a, e, k245.c_str(), kTimestamp, true, 0},
      {"PKCS#1 refuses 246 bytes for 2048 bits", 30, a, e, k246.c_str(), kTimestamp, true, 12},
      {"Keyou takes 254 bytes for 2048 bits", 29, a, e, k254.c_str(), kTimestamp, true, 0},
      {"Keyou refuses 255 bytes for 2048 bits", 29, a, e, k255.c_str(), kTimestamp, true, 13},
      {"not a modulus", 0, "XYZ", e, "pw", kTimestamp, true, 12},
      {"RSA refuses a block above the modulus", 29, a, lowTopModulus.c_str(), "pw", kTimestamp, true, 7},
  };
  for (const Case& c : cases) {
    const Dispatched d = dispatch(c.type, c.app, c.enc, c.text, c.timestamp, c.result);
    EXPECT_EQ(d.code, c.code) << c.name;
    if (c.result) {
      EXPECT_EQ(d.present, c.code == 0) << c.name << ": result must be absent on failure";
    }
  }
}

TEST_F(DispatchTypes, AppFamilyNeverReportsBothMissing) {
  for (int type = 0; type <= 90; ++type) {
    const server::TypeLayout layout = server::typeLayout(type);
    if (layout.outer == Outer::Unknown) continue;
    const bool app = layout.outer == Outer::DirectWithApp || layout.outer == Outer::BareEnvelope ||
                     (layout.outer == Outer::WrappedEnvelope &&
                      (layout.inner == Inner::Text || layout.inner == Inner::Hashed));
    const bool encOnly = layout.outer == Outer::DirectWithEnc;
    const int expected = app ? 1 : encOnly ? 2 : 3;
    EXPECT_EQ(dispatch(type, nullptr, nullptr, "pw", kTimestamp).code, expected) << type;
    if (app) {
      EXPECT_EQ(dispatch(type, app_.c_str(), nullptr, "pw", kTimestamp).code, 0) << type;
    }
  }
}

TEST_F(DispatchTypes, LengthPrefixedPairMustFitItsBuffer) {
  // "%02d" ts "%02d" text: 2 + 99 + 2 + 24 = 127 characters and the terminator fill the 128-byte
  // buffer of types 4, 8, 46 and 51; one more is refused.
  const std::string ts(99, 't'), fits(24, 'p'), tooLong(25, 'p');
  for (int type : {4, 8, 46, 51}) {
    EXPECT_EQ(dispatch(type, app_.c_str(), enc_.c_str(), fits.c_str(), ts.c_str()).code, 0) << type;
    EXPECT_EQ(dispatch(type, app_.c_str(), enc_.c_str(), tooLong.c_str(), ts.c_str()).code, 21) << type;
  }
  // Type 22 builds the pair on the heap: only the modulus bounds it.
  EXPECT_EQ(dispatch(22, app_.c_str(), enc_.c_str(), tooLong.c_str(), ts.c_str()).code, 0);
  const server::Opened out = roundTrip(8, "Kqhzmw");
  EXPECT_EQ(out.content, "Kqhzmw");
}

bool failingSource(std::uint8_t*, std::size_t) { return false; }

struct RandomSourceOverride {
  explicit RandomSourceOverride(RandomSource s) { setRandomSourceForTesting(s); }
  ~RandomSourceOverride() { setRandomSourceForTesting(nullptr); }
};

TEST_F(DispatchTypes, RandomFailureCodes) {
  RandomSourceOverride failing(failingSource);
  EXPECT_EQ(dispatch(0, app_.c_str(), enc_.c_str(), "pw", kTimestamp).code, 9) << "envelope key";
  EXPECT_EQ(dispatch(38, app_.c_str(), enc_.c_str(), "1234", kTimestamp).code, 9) << "triple-DES key";
  EXPECT_EQ(dispatch(30, app_.c_str(), enc_.c_str(), "pw", kTimestamp).code, 12) << "PKCS#1 filler";
  EXPECT_EQ(dispatch(29, app_.c_str(), enc_.c_str(), "pw", kTimestamp).code, 13) << "Keyou filler";
}

}  // namespace
}  // namespace tessel::test
