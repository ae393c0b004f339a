// The server-side opener (tools/server) on its own, against envelopes and RSA values built with
// OpenSSL in the test: layout, key unwrap, keystream drops, payload layouts, salted hashes, and
// refusal of corrupt, truncated and foreign input by the library and the tessel_open command.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <vector>

#include "server/envelope.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

const Bytes kRc4Key = fromHex("00112233445566778899aabbccddeeff");

TEST(ServerEnvelope, OpensOpenSslEnvelopesAtEachDrop) {
  for (const auto& [drop, content] : {std::pair{std::size_t{512}, std::string("S20240101:secret text")},
                                      {std::size_t{625}, std::string("S20240101:secret text")},
                                      {std::size_t{768}, std::string("S20240101:secret text")},
                                      {std::size_t{512}, std::string()}}) {
    const std::string envelope = opensslEnvelope(appKey(), kRc4Key, drop, content);
    std::string opened = "x", error;
    ASSERT_TRUE(server::openEnvelope(envelope, appKey(), drop, &opened, &error)) << error;
    EXPECT_EQ(opened, content) << "drop " << drop;
  }
  const CliRun run = runOpenCli({"--layout", opensslEnvelope(appKey(), kRc4Key, 512, "0123456789")});
  EXPECT_EQ(run.out + run.err, "key-blob-length: 140\nrsa-length: 128\ncontent-length: 10\ntotal-length: 166\n");
}

// Each bad envelope must be refused with one line that names what is wrong.
TEST(ServerEnvelope, RefusesCorruptTruncatedAndForeignEnvelopes) {
  const std::string good = opensslEnvelope(appKey(), kRc4Key, 512, "S1700000000:hello");
  auto edited = [&](const std::function<void(Bytes&)>& edit) {
    Bytes copy = opensslBase64Decode(good);
    edit(copy);
    return opensslBase64(copy);
  };
  const struct {
    const char* name;
    std::string envelope;
    const server::PrivateKey* key;
    const char* expected;  // part of the message
  } cases[] = {
      {"empty", "", &appKey(), "empty"},
      {"cut inside a base64 group", good.substr(0, good.size() - 1), &appKey(), "base64"},
      {"cut inside the wrapped key", edited([](Bytes& b) { b.resize(60); }), &appKey(), "truncated"},
      {"header only", edited([](Bytes& b) { b.resize(12); }), &appKey(), "truncated"},
      {"key length too small", edited([](Bytes& b) { std::fill(b.begin(), b.begin() + 8, '0'); }), &appKey(),
       "too small"},
      {"not a SIMPLEBLOB", edited([](Bytes& b) { b[13] = 0x66; }), &appKey(), "SIMPLEBLOB"},
      {"letter in the content length", edited([](Bytes& b) { b[8 + 140 + 2] = '-'; }), &appKey(), "8 digits"},
      {"content length too long", edited([](Bytes& b) { b[8 + 140 + 6] = '9'; }), &appKey(), "truncated"},
      {"wrapped key damaged", edited([](Bytes& b) { b[100] ^= 0x40; }), &appKey(), "unwrap"},
      {"foreign key of another size", good, &encKey(), "foreign"},
  };
  for (const auto& c : cases) {
    std::string opened, error;
    EXPECT_FALSE(server::openEnvelope(c.envelope, *c.key, 512, &opened, &error)) << c.name;
    EXPECT_NE(error.find(c.expected), std::string::npos) << c.name << ": " << error;
    EXPECT_EQ(error.find('\n'), std::string::npos) << c.name;
    EXPECT_EQ(error.find("hello"), std::string::npos) << c.name << ": message leaks content";
  }
}

TEST(ServerPayloads, WrapperKeyouBlocksAndLengthPrefixedPairs) {
  // Each row: the text, whether it parses, and the fields it gives ("|" between two fields).
  const std::string filler(20, '\x5a');
  const struct {
    char kind;  // W wrapper (L: split at the last ':'), K Keyou block, P length-prefixed pair
    std::string in;
    bool ok;
    std::string fields;
  } cases[] = {
      {'W', "S1700000000:pay:load", true, "S|1700000000|pay:load"},
      {'W', "", false, ""}, {'W', "S123", false, ""}, {'W', "X123:abc", false, ""},
      {'L', "S2024-01-01 12:00:00:0A1B", true, "S|2024-01-01 12:00:00|0A1B"},
      {'L', "S123", false, ""}, {'L', ":123", false, ""},
      {'K', "05hello" + filler, true, "hello"},
      {'K', "00" + filler, false, ""}, {'K', "99abc", false, ""}, {'K', "a5hello", false, ""},
      {'K', ":0" + std::string(100, 'm') + "zz", true, std::string(100, 'm')},  // 100 runs past '9'
      {'P', "041700041234", true, "1700|1234"},
      {'P', "0000", true, "|"},
      {'P', "10170000000005hello", true, "1700000000|hello"},
      {'P', "02ab" "100" + std::string(100, 't'), true, "ab|" + std::string(100, 't')},
      {'P', "0417000510pw", false, ""}, {'P', "041700021", false, ""}, {'P', "0417000212345", false, ""},
      {'P', "x", false, ""},
  };
  for (const auto& c : cases) {
    std::string a, b, error, fields;
    server::Wrapped w;
    bool ok = false;
    if (c.kind == 'W' || c.kind == 'L') {
      ok = server::splitWrapped(c.in, &w, &error, c.kind == 'L');
      fields = std::string(1, w.strength) + "|" + w.timestamp + "|" + w.payload;
    } else if (c.kind == 'K') {
      ok = server::parseKeyouBlock(c.in, &a, &error);
      fields = a;
    } else {
      ok = server::parseLengthPrefixedPair(c.in, &a, &b, &error);
      fields = a + "|" + b;
    }
    EXPECT_EQ(ok, c.ok) << c.kind << " " << c.in;
    if (c.ok) { EXPECT_EQ(fields, c.fields) << c.kind << " " << c.in; }
  }
}

TEST(ServerPayloads, SaltedHashesAndPasswordMatching) {
  // Values computed with Python's hashlib: md5(md5(p).hexdigest() + salt).hexdigest().
  const struct {
    const char *password, *salt;
    char mode;
    const char* value;
  } hashes[] = {
      {"pw", "salt", 'S', "c359e5975c5a3f45"},
      {"pw", "salt", 'F', "38b311d8c359e5975c5a3f454d3f4294"},
      {"123456", "a1b2c3", 'S', "f8bbb18037919adc"},
      {"Passw0rd!", "::x::", 'F', "f061fc492d56eb9b8e2dfe6bdd59f73c"},
      {"pw", "salt", 'X', ""},
  };
  for (const auto& c : hashes) EXPECT_EQ(server::saltedHashValue(c.password, c.salt, c.mode), c.value) << c.password;
  const struct {
    int type;
    std::string content, password, salt;
    char mode;
    bool match;
  } matches[] = {
      {47, "c359e5975c5a3f45", "pw", "salt", 'S', true},
      {48, "38b311d8c359e5975c5a3f454d3f4294", "pw", "salt", 'F', true},
      {48, "38b311d8c359e5975c5a3f454d3f4294", "pw", "salt", 'S', false},
      {59, "pw", "pw", "", 'S', true},  // no hash random set: the password itself
      // SHA-1("abc"), FIPS 180-4 example
      {5, "A9993E364706816ABA3E25717850C26C9CD0D89D", "abc", "", 'S', true},
      {5, "A9993E364706816ABA3E25717850C26C9CD0D89D", "abd", "", 'S', false},
      {0, "hello", "hello", "", 'S', true},
      {0, "hello", "hello!", "", 'S', false},
      {0, "", "", "", 'S', true},
  };
  server::Opened opened;
  opened.contentOpened = true;
  for (const auto& c : matches) {
    opened.content = c.content;
    EXPECT_EQ(server::matchesPassword(c.type, opened, c.password, c.salt, c.mode), c.match)
        << c.type << " " << c.password;
  }
  opened.contentOpened = false;
  EXPECT_FALSE(server::matchesPassword(0, opened, "hello", "", 'S'));
}

TEST(ServerPayloads, RsaLayoutsAndPinKeyDerivationAgainstOpenSsl) {
  std::string plain, error;
  const Bytes cipher = opensslPkcs1Encrypt(encKey(), bytesOf("hello"));
  Bytes block = bytesOf("05hello");
  block.resize(encKey().size(), 0x33);
  const Bytes keyou = opensslRawEncrypt(encKey(), block);
  using Opener = bool (*)(const server::PrivateKey&, const std::string&, std::string*, std::string*);
  for (const auto& [opener, text] : {std::pair<Opener, std::string>{server::openPkcs1Hex, toHex(cipher)},
                                   {server::openPkcs1Base64, opensslBase64(cipher)},
                                   {server::openKeyouHex, toHex(keyou)},
                                   {server::openKeyouBase64, opensslBase64(keyou)}}) {
    ASSERT_TRUE(opener(encKey(), text, &plain, &error)) << error;
    EXPECT_EQ(plain, "hello");
  }
  EXPECT_FALSE(server::openPkcs1Hex(appKey(), toHex(cipher), &plain, &error)) << "2048-bit value, 1024-bit key";
  EXPECT_FALSE(server::openPkcs1Hex(encKey(), "zz", &plain, &error));
  // A timestamp with ':' before an RSA payload; without the encryption key it stays sealed.
  server::OpenKeys keys{&appKey(), &encKey(), "", false};
  server::Opened out;
  const std::string type10 = opensslEnvelope(appKey(), kRc4Key, 512, "S2024-01-01 12:00:00:" + toHex(cipher));
  ASSERT_TRUE(server::openOutput(10, type10, keys, &out, &error)) << error;
  EXPECT_EQ(out.timestamp + "|" + out.content, "2024-01-01 12:00:00|hello");
  keys.enc = nullptr;
  EXPECT_TRUE(server::openOutput(10, type10, keys, &out, &error) && !out.contentOpened) << error;

}

// ---- the command line

TEST(ServerCli, BadInputGivesOneLineAndNonZeroExit) {
  const std::string good = opensslEnvelope(appKey(), kRc4Key, 512, "S1700000000:c359e5975c5a3f45");  // 48
  const std::string app = dataPath("dispatch_app_key_1024.pem");
  const struct {
    const char* name;
    std::vector<std::string> args;
    int status;
  } cases[] = {
      {"garbage", {"--key", app, "hello world"}, 1},
      {"type 48 opened as 47", {"--type", "47", "--key", app, good}, 1},
      {"key file missing", {"--key", "/nonexistent.pem", good}, 2},
      {"key file not PEM", {"--key", dataPath("SOURCES.md"), good}, 2},
      {"unknown type", {"--type", "65", "--key", app, good}, 2},
      {"no key", {good}, 2},
      {"no encryption key for type 30", {"--type", "30", "--key", app, good}, 2},
      {"no output", {"--key", app}, 2},
      {"bad type", {"--type", "x1", good}, 2},
      {"salt without password", {"--key", app, "--salt", "s", good}, 2},
      {"wrong password", {"--type", "0", "--key", app, "--password", "c359e5975c5a3f4", good}, 3},
  };
  for (const auto& c : cases) {
    const CliRun run = runOpenCli(c.args);
    EXPECT_EQ(run.status, c.status) << c.name << ": " << run.err;
    EXPECT_EQ(run.err.rfind("tessel_open: ", 0), 0u) << c.name << ": " << run.err;
    EXPECT_EQ(run.err.find('\n'), run.err.size() - 1) << c.name << ": not one line: " << run.err;
  }
}

}  // namespace
}  // namespace tessel::test
