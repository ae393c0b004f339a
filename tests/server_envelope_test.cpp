// The server-side opener (tools/server) on its own, against envelopes and RSA values built with
// OpenSSL in the test: layout, key unwrap, keystream drops, payload layouts, salted hashes, and
// refusal of corrupt, truncated and foreign input by the library and the tessel_open command.
#include <gtest/gtest.h>

#include <functional>

#include "server/envelope.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

using server::PrivateKey;

const Bytes kRc4Key = fromHex("00112233445566778899aabbccddeeff");

TEST(ServerEnvelope, OpensOpenSslEnvelopesAtEachDrop) {
  for (std::size_t drop : {512u, 625u, 768u}) {
    const std::string content = "S20240101:secret text";
    const std::string envelope = opensslEnvelope(appKey(), kRc4Key, drop, content);
    std::string opened, error;
    ASSERT_TRUE(server::openEnvelope(envelope, appKey(), drop, &opened, &error)) << error;
    EXPECT_EQ(opened, content) << "drop " << drop;
    ASSERT_TRUE(server::openEnvelope(envelope, appKey(), drop == 512 ? 625 : 512, &opened, &error));
    EXPECT_NE(opened, content) << "a wrong drop must not open the content";
  }
  EXPECT_EQ(server::envelopeDrop(1), 625u);
  EXPECT_EQ(server::envelopeDrop(33), 625u);
  EXPECT_EQ(server::envelopeDrop(88), 768u);
  EXPECT_EQ(server::envelopeDrop(48), 512u);
}

TEST(ServerEnvelope, LayoutOfA1024BitKeyAndTenBytes) {
  const std::string envelope = opensslEnvelope(appKey(), kRc4Key, 512, "0123456789");
  server::EnvelopeLayout layout;
  std::string error;
  ASSERT_TRUE(server::parseEnvelope(envelope, &layout, &error)) << error;
  EXPECT_EQ(layout.keyBlobLength, 140u);
  EXPECT_EQ(layout.rsaLength, 128u);
  EXPECT_EQ(layout.contentLength, 10u);
  EXPECT_EQ(layout.totalLength, 166u);
  const Bytes raw = opensslBase64Decode(envelope);
  EXPECT_EQ(std::string(raw.begin(), raw.begin() + 8), "00000140");
}

TEST(ServerEnvelope, EmptyContentOpens) {
  const std::string envelope = opensslEnvelope(appKey(), kRc4Key, 512, "");
  std::string opened = "x", error;
  ASSERT_TRUE(server::openEnvelope(envelope, appKey(), 512, &opened, &error)) << error;
  EXPECT_EQ(opened, "");
}

// Each bad envelope must be refused with one line that names what is wrong.
TEST(ServerEnvelope, RefusesCorruptTruncatedAndForeignEnvelopes) {
  const std::string good = opensslEnvelope(appKey(), kRc4Key, 512, "S1700000000:hello");
  const Bytes raw = opensslBase64Decode(good);
  auto edited = [&](const std::function<void(Bytes&)>& edit) {
    Bytes copy = raw;
    edit(copy);
    return opensslBase64(copy);
  };
  struct Case {
    const char* name;
    std::string envelope;
    const PrivateKey* key;
    const char* expected;  // part of the message
  };
  const Case cases[] = {
      {"empty", "", &appKey(), "empty"},
      {"not base64", "@@@@" + good, &appKey(), "base64"},
      {"cut inside a base64 group", good.substr(0, good.size() - 1), &appKey(), "base64"},
      {"cut at a group boundary", edited([](Bytes& b) { b.resize(b.size() - 3); }), &appKey(), "truncated"},
      {"cut inside the wrapped key", edited([](Bytes& b) { b.resize(60); }), &appKey(), "truncated"},
      {"header only", edited([](Bytes& b) { b.resize(12); }), &appKey(), "truncated"},
      {"bytes after the content", edited([](Bytes& b) { b.insert(b.end(), {1, 2, 3}); }), &appKey(), "after"},
      {"letter in the key length", edited([](Bytes& b) { b[3] = 'x'; }), &appKey(), "8-digit"},
      {"key length too small", edited([](Bytes& b) { std::fill(b.begin(), b.begin() + 8, '0'); }), &appKey(),
       "too small"},
      {"not a SIMPLEBLOB", edited([](Bytes& b) { b[13] = 0x66; }), &appKey(), "SIMPLEBLOB"},
      {"letter in the content length", edited([](Bytes& b) { b[8 + 140 + 2] = '-'; }), &appKey(), "8 digits"},
      {"content length too long", edited([](Bytes& b) { b[8 + 140 + 6] = '9'; }), &appKey(), "truncated"},
      {"wrapped key damaged", edited([](Bytes& b) { b[100] ^= 0x40; }), &appKey(), "unwrap"},
      {"foreign key of the same size", good, &foreignKey(), "unwrap"},
      {"foreign key of another size", good, &encKey(), "foreign"},
  };
  for (const Case& c : cases) {
    std::string opened, error;
    EXPECT_FALSE(server::openEnvelope(c.envelope, *c.key, 512, &opened, &error)) << c.name;
    EXPECT_NE(error.find(c.expected), std::string::npos) << c.name << ": " << error;
    EXPECT_EQ(error.find('\n'), std::string::npos) << c.name;
    EXPECT_EQ(error.find("hello"), std::string::npos) << c.name << ": message leaks content";
  }
}

TEST(ServerEnvelope, SplitsTheStrengthWrapper) {
  server::Wrapped w;
  std::string error;
  ASSERT_TRUE(server::splitWrapped("S1700000000:pay:load", &w, &error));
  EXPECT_EQ(w.strength, 'S');
  EXPECT_EQ(w.timestamp, "1700000000");
  EXPECT_EQ(w.payload, "pay:load");
  ASSERT_TRUE(server::splitWrapped("E:", &w, &error));
  EXPECT_EQ(w.timestamp, "");
  EXPECT_EQ(w.payload, "");
  for (const char* bad : {"", "S", "S123", "X123:abc"}) EXPECT_FALSE(server::splitWrapped(bad, &w, &error)) << bad;
}

TEST(ServerPayloads, KeyouBlocks) {
  struct Case {
    std::string block;
    bool ok;
    std::string message;
  };
  const std::string filler(20, '\x5a');
  const Case cases[] = {
      {"05hello" + filler, true, "hello"},
      {"01x" + filler, true, "x"},
      {std::string("00") + filler, false, ""},
      {"99abc", false, ""},
      {"a5hello", false, ""},
      {std::string(":0") + std::string(100, 'm') + "zz", true, std::string(100, 'm')},  // 100 runs past '9'
  };
  for (const Case& c : cases) {
    std::string message, error;
    EXPECT_EQ(server::parseKeyouBlock(c.block, &message, &error), c.ok) << c.block;
    if (c.ok) {
      EXPECT_EQ(message, c.message);
    }
  }
}

TEST(ServerPayloads, LengthPrefixedPairs) {
  struct Case {
    std::string pair;
    bool ok;
    std::string timestamp, text;
  };
  const Case cases[] = {
      {"0417000510pw", false, "", ""},
      {"041700041234", true, "1700", "1234"},
      {"0000", true, "", ""},
      {"10170000000005hello", true, "1700000000", "hello"},
      {"02ab" "100" + std::string(100, 't'), true, "ab", std::string(100, 't')},
      {"041700021", false, "", ""},
      {"0417000212345", false, "", ""},
      {"x", false, "", ""},
  };
  for (const Case& c : cases) {
    std::string ts, text, error;
    EXPECT_EQ(server::parseLengthPrefixedPair(c.pair, &ts, &text, &error), c.ok) << c.pair;
    if (c.ok) {
      EXPECT_EQ(ts, c.timestamp);
      EXPECT_EQ(text, c.text);
    }
  }
}

// Values computed with Python's hashlib: md5(md5(p).hexdigest() + salt).hexdigest().
TEST(ServerPayloads, SaltedHashKnownAnswers) {
  struct Case {
    const char *password, *salt;
    char mode;
    const char* value;
  };
  const Case cases[] = {
      {"pw", "salt", 'S', "c359e5975c5a3f45"},
      {"pw", "salt", 'F', "38b311d8c359e5975c5a3f454d3f4294"},
      {"123456", "a1b2c3", 'S', "f8bbb18037919adc"},
      {"Passw0rd!", "::x::", 'F', "f061fc492d56eb9b8e2dfe6bdd59f73c"},
  };
  for (const Case& c : cases) EXPECT_EQ(server::saltedHashValue(c.password, c.salt, c.mode), c.value);
  EXPECT_EQ(server::saltedHashValue("pw", "salt", 'X'), "");
}

TEST(ServerPayloads, RsaLayoutsRoundTripWithOpenSsl) {
  std::string plain, error;
  const Bytes cipher = opensslPkcs1Encrypt(encKey(), bytesOf("hello"));
  ASSERT_TRUE(server::openPkcs1Hex(encKey(), toHex(cipher), &plain, &error)) << error;
  EXPECT_EQ(plain, "hello");
  ASSERT_TRUE(server::openPkcs1Base64(encKey(), opensslBase64(cipher), &plain, &error)) << error;
  EXPECT_EQ(plain, "hello");
  EXPECT_FALSE(server::openPkcs1Hex(appKey(), toHex(cipher), &plain, &error)) << "2048-bit value, 1024-bit key";
  EXPECT_FALSE(server::openPkcs1Hex(encKey(), "zz", &plain, &error));

  Bytes block = bytesOf("05hello");
  block.resize(encKey().size(), 0x33);
  const Bytes keyou = opensslRawEncrypt(encKey(), block);
  ASSERT_TRUE(server::openKeyouHex(encKey(), toHex(keyou), &plain, &error)) << error;
  EXPECT_EQ(plain, "hello");
  ASSERT_TRUE(server::openKeyouBase64(encKey(), opensslBase64(keyou), &plain, &error)) << error;
  EXPECT_EQ(plain, "hello");
}

TEST(ServerPayloads, PinKeyDerivationOfType68) {
  const Bytes master = fromHex("0123456789abcdeffedcba9876543210");
  const Bytes working = fromHex("1111111111111111e0e0e0e0f1f1f1f1");
  const Bytes pinKey = fromHex("2323232323232323abababababababab");
  const std::string a = toHex(opensslDesEde(master, working, true));
  const std::string b = toHex(opensslDesEde(working, pinKey, true));
  std::string derived, error;
  ASSERT_TRUE(server::derivePinKey68(toHex(master), a, b, &derived, &error)) << error;
  EXPECT_EQ(toHex(bytesOf(derived)), toHex(pinKey));
  EXPECT_FALSE(server::derivePinKey68(toHex(master), a.substr(2), b, &derived, &error));
  EXPECT_FALSE(server::derivePinKey68(toHex(master), "zz" + a.substr(2), b, &derived, &error));
}

TEST(ServerPayloads, PasswordMatchingByType) {
  server::Opened opened;
  opened.contentOpened = true;
  struct Case {
    int type;
    std::string content, password, salt;
    char mode;
    bool match;
  };
  const Case cases[] = {
      {47, "c359e5975c5a3f45", "pw", "salt", 'S', true},
      {48, "38b311d8c359e5975c5a3f454d3f4294", "pw", "salt", 'F', true},
      {48, "38b311d8c359e5975c5a3f454d3f4294", "pw", "salt", 'S', false},
      {59, "pw", "pw", "", 'S', true},  // no hash random set: the password itself
      {55, "c359e5975c5a3f45", "pw", "salt", 'X', false},
      // SHA-1("abc"), FIPS 180-4 example
      {5, "A9993E364706816ABA3E25717850C26C9CD0D89D", "abc", "", 'S', true},
      {5, "A9993E364706816ABA3E25717850C26C9CD0D89D", "abd", "", 'S', false},
      {0, "hello", "hello", "", 'S', true},
      {0, "hello", "hello!", "", 'S', false},
      {0, "", "", "", 'S', true},
  };
  for (const Case& c : cases) {
    opened.content = c.content;
    EXPECT_EQ(server::matchesPassword(c.type, opened, c.password, c.salt, c.mode), c.match)
        << c.type << " " << c.password;
  }
  opened.contentOpened = false;
  EXPECT_FALSE(server::matchesPassword(0, opened, "hello", "", 'S'));
}

// ---- the command line

TEST(ServerCli, OpensAnEnvelopeAndChecksTheSaltedHash) {
  const std::string value = expectedSaltedHash("pw", "salt", 'S');
  const std::string envelope = opensslEnvelope(appKey(), kRc4Key, 512, "W1700000000:" + value);
  const std::string key = dataPath("dispatch_app_key_1024.pem");
  CliRun run = runOpenCli({"--type", "48", "--key", key, "--password", "pw", "--salt", "salt", envelope});
  EXPECT_EQ(run.status, 0) << run.err;
  EXPECT_EQ(run.out, "strength: W\ntimestamp: 1700000000\npayload: " + value + "\ncontent: " + value +
                         "\npassword: match\n");
  EXPECT_EQ(run.err, "");

  run = runOpenCli({"--type", "48", "--key", key, "--password", "pw2", "--salt", "salt", "-"}, envelope + "\n");
  EXPECT_EQ(run.status, 3);
  EXPECT_NE(run.out.find("password: mismatch"), std::string::npos);

  run = runOpenCli({"--layout", envelope});
  EXPECT_EQ(run.status, 0);
  EXPECT_EQ(run.out, "key-blob-length: 140\nrsa-length: 128\ncontent-length: 28\ntotal-length: 184\n");
}

TEST(ServerCli, BadInputGivesOneLineAndNonZeroExit) {
  const std::string good = opensslEnvelope(appKey(), kRc4Key, 512, "S1700000000:hello");
  const std::string app = dataPath("dispatch_app_key_1024.pem");
  const std::string foreign = dataPath("dispatch_foreign_key_1024.pem");
  Bytes raw = opensslBase64Decode(good);
  raw.resize(raw.size() - 6);
  const std::string truncated = opensslBase64(raw);
  struct Case {
    const char* name;
    std::vector<std::string> args;
    int status;
  };
  const Case cases[] = {
      {"corrupt", {"--key", app, good.substr(0, 40) + "!!!!" + good.substr(44)}, 1},
      {"truncated", {"--key", app, truncated}, 1},
      {"foreign", {"--key", foreign, good}, 1},
      {"garbage", {"--key", app, "hello world"}, 1},
      {"key file missing", {"--key", "/nonexistent.pem", good}, 1},
      {"key file not PEM", {"--key", dataPath("../server_envelope_test.cpp"), good}, 1},
      {"unknown type", {"--type", "65", "--key", app, good}, 1},
      {"no key", {good}, 1},
      {"no output", {"--key", app}, 2},
      {"unknown option", {"--frobnicate", good}, 2},
      {"bad type", {"--type", "x1", good}, 2},
      {"salt without password", {"--key", app, "--salt", "s", good}, 2},
      {"wrong password", {"--type", "0", "--key", app, "--password", "hellO", good}, 3},
  };
  for (const Case& c : cases) {
    const CliRun run = runOpenCli(c.args);
    EXPECT_EQ(run.status, c.status) << c.name << ": " << run.err;
    ASSERT_FALSE(run.err.empty()) << c.name;
    EXPECT_EQ(run.err.rfind("tessel_open: ", 0), 0u) << c.name << ": " << run.err;
    EXPECT_EQ(run.err.find('\n'), run.err.size() - 1) << c.name << ": not one line: " << run.err;
  }
}

}  // namespace
}  // namespace tessel::test
