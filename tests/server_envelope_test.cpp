// The server-side opener (tools/server) on its own, against envelopes and RSA values built with
// OpenSSL in the test: the one answer to every forgery, implicit rejection, the split rule,
// strict base64, the input cap, secret files and the encrypted PIN code.
#include <gtest/gtest.h>
#include <openssl/bn.h>
#include <openssl/core_names.h>
#include <openssl/err.h>
#include <openssl/hmac.h>

#include <algorithm>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "server/bytes.h"
#include "server/encrypted_pin_code.h"
#include "server/password_check.h"
#include "server/payloads.h"
#include "support/dispatch_oracle.h"

namespace tessel::test {
namespace {

const Bytes kRc4Key = fromHex("00112233445566778899aabbccddeeff");
const std::string kTs = "2024-01-01 12:00:00";

std::string text(const Bytes& b) { return std::string(b.begin(), b.end()); }
// A raw block of k bytes: `head` then `fill`.
Bytes block(const server::PrivateKey& key, const Bytes& head, std::uint8_t fill = 0x5a) {
  Bytes b = head;
  b.resize(key.size(), fill);
  return b;
}
std::string keyou(const server::PrivateKey& key) { return text(opensslRawEncrypt(key, block(key, bytesOf("05hello")))); }
std::string pkcs1(const server::PrivateKey& key, const std::string& m) { return text(opensslPkcs1Encrypt(key, bytesOf(m))); }
std::string hexOf(const std::string& s) { return toHex(bytesOf(s)); }
std::string b64Of(const std::string& s) { return opensslBase64(bytesOf(s)); }
const std::string kPair = "19" + kTs + "05hello";

TEST(ServerEnvelope, OpensOpenSslEnvelopesAtEachDrop) {
  for (std::size_t drop : {512, 625, 768}) {
    std::string opened, error;
    ASSERT_TRUE(server::openEnvelope(opensslEnvelope(appKey(), kRc4Key, drop, "S1:x"), appKey(), drop, &opened, &error));
    EXPECT_EQ(opened, "S1:x") << drop;
  }
  const CliRun run = runOpenCli({"--layout", opensslEnvelope(appKey(), kRc4Key, 512, "0123456789")});
  EXPECT_EQ(run.out + run.err, "key-blob-length: 140\nrsa-length: 128\ncontent-length: 10\ntotal-length: 166\n");
}

// Public bytes wrong: each keeps its own one-line message, exit 1, no private-key operation.
TEST(ServerEnvelope, PublicByteErrorsNameWhatIsWrong) {
  const std::string good = opensslEnvelope(appKey(), kRc4Key, 512, "S1700000000:hello");
  auto edited = [&](const std::function<void(Bytes&)>& edit) {
    Bytes copy = opensslBase64Decode(good);
    edit(copy);
    return opensslBase64(copy);
  };
  const struct {
    std::string envelope;
    const char* expected;  // part of the message
  } cases[] = {
      {"", "empty"},
      {good.substr(0, good.size() - 1), "base64"},
      {good + "-ANYTHING<script>", "base64"},
      {good.substr(0, 8) + "\n" + good.substr(8, good.size() - 9), "base64"},
      {std::string(65537, 'A'), "output longer than 65536 bytes"},
      {edited([](Bytes& b) { b.resize(60); }), "truncated"},
      {edited([](Bytes& b) { std::fill(b.begin(), b.begin() + 8, '0'); }), "too small"},
      {edited([](Bytes& b) { b[13] = 0x66; }), "SIMPLEBLOB"},
      {edited([](Bytes& b) { b[8 + 140 + 2] = '-'; }), "8 digits"},
      {edited([](Bytes& b) { b.push_back('x'); }), "after its content"},
      {opensslEnvelope(encKey(), kRc4Key, 512, "S1:x"), "foreign"},
      {std::string(65538, 'a'), "output longer than 65536 bytes"},  // as type 56, a bare RSA value
  };
  for (const auto& c : cases) {
    const std::string type = c.envelope.size() == 65538 ? "56" : "48";
    const CliRun run = runOpenCli({"--type", type, "--key", dataPath("dispatch_app_key_1024.pem"), c.envelope});
    EXPECT_EQ(run.status, 1) << c.expected;
    EXPECT_NE(run.err.find(c.expected), std::string::npos) << run.err;
    EXPECT_EQ(run.err.find('\n'), run.err.size() - 1) << run.err;
  }
}

// Strict base64: exactly the canonical standard form, checked against OpenSSL's encoder.
TEST(ServerBytes, Base64IsStrict) {
  for (std::size_t n = 1; n <= 7; ++n) {
    const Bytes data(n, static_cast<std::uint8_t>(0xA5 + n));
    std::string out, error;
    ASSERT_TRUE(server::fromBase64(opensslBase64(data), &out, "x", &error)) << error;
    EXPECT_EQ(out, text(data));
  }
  for (const char* bad : {"", "QQ", "QQ=", "QR==", "QUI=x", "QU=I", "Q===", "QUJD\n", " QUJD", "QUJ-", "QUJD===="}) {
    std::string out;
    EXPECT_FALSE(server::fromBase64(bad, &out, "x", nullptr)) << bad;
  }
}

// The draft's synthetic message of n bytes, written here from its text with OpenSSL's HMAC:
// KDK = HMAC(SHA-256(d), c); the last n bytes of HMAC(KDK, u16(i) "message" u16(8k)), i = 0, 1, ...
std::string draftSynthetic(const server::PrivateKey& key, const std::string& cipher, std::size_t n) {
  BIGNUM* d = nullptr;
  EVP_PKEY_get_bn_param(key.get(), OSSL_PKEY_PARAM_RSA_D, &d);
  Bytes dBytes(key.size());
  BN_bn2binpad(d, dBytes.data(), static_cast<int>(dBytes.size()));
  BN_free(d);
  const Bytes dHash = opensslDigest("SHA256", dBytes);
  unsigned char kdk[32], block[32];
  unsigned int len = 0;
  HMAC(EVP_sha256(), dHash.data(), 32, reinterpret_cast<const unsigned char*>(cipher.data()), cipher.size(), kdk, &len);
  std::string prf;
  const std::size_t bits = 8 * key.size();
  for (unsigned i = 0; prf.size() < key.size(); ++i) {
    const std::string in = std::string{char(i >> 8), char(i)} + "message" + std::string{char(bits >> 8), char(bits)};
    HMAC(EVP_sha256(), kdk, 32, reinterpret_cast<const unsigned char*>(in.data()), in.size(), block, &len);
    prf.append(reinterpret_cast<char*>(block), 32);
  }
  return prf.substr(key.size() - n);
}

// Implicit rejection against OpenSSL's explicit PKCS#1 decryption: where OpenSSL unpads, the
// same message; where it refuses, the key's synthetic message, never a failure.
TEST(ServerKeys, ImplicitRejectionAgreesWithOpenSslWhereItUnpads) {
  const server::PrivateKey& key = appKey();
  const struct {
    const char* head;
    std::size_t padding;   // bytes of 07 before the 00 separator (none when it fills the block)
    std::size_t expected;  // length asked for; 0 any
  } rows[] = {
      {"0002", 9, 0}, {"0002", 8, 117}, {"0002", 7, 0} /* padding too short */, {"0001", 9, 0} /* type 1 */,
      {"0102", 9, 0}, {"0002", 126, 0} /* no separator */, {"0002", 110, 16} /* 15 bytes */,
      {"0002", 108, 16} /* 17 bytes */,
  };
  for (const auto& r : rows) {
    Bytes plain = fromHex(r.head);
    plain.resize(2 + r.padding, 7);
    plain.push_back(0);
    const std::string cipher = text(opensslRawEncrypt(key, block(key, plain, 0x41)));
    std::string message, again, error;
    ASSERT_TRUE(key.decryptPkcs1(cipher, r.expected, &message, &error)) << error;
    EXPECT_EQ(ERR_peek_error(), 0u);
    std::string oracle;
    try {
      oracle = text(opensslPkcs1Decrypt(key, bytesOf(cipher)));
    } catch (const std::exception&) {
      oracle = "refused";
    }
    const bool unpads = oracle != "refused" && (r.expected == 0 || oracle.size() == r.expected);
    const std::string synthetic = key.syntheticMessage(cipher, r.expected);
    EXPECT_EQ(message, unpads ? oracle : synthetic) << r.head << " " << r.padding;
    if (r.expected == 0) { EXPECT_LT(synthetic.size(), key.size() - 10); }
    if (r.expected == 16) { EXPECT_EQ(message, draftSynthetic(key, cipher, 16)); }
    ASSERT_TRUE(key.decryptPkcs1(cipher, r.expected, &again, &error));
    EXPECT_EQ(again, message) << "deterministic";
  }
  // A value not below the modulus: rejected like a bad block, OpenSSL's complaint cleared.
  const std::string above(key.size(), '\xff');
  std::string message;
  ASSERT_TRUE(key.decryptPkcs1(above, 16, &message, nullptr));
  EXPECT_EQ(message, draftSynthetic(key, above, 16));
  EXPECT_EQ(ERR_peek_error(), 0u);
}

// The one answer: every forged envelope of every RSA-bearing form, another type, another
// timestamp and a wrong password give the same status, the same line and nothing on stdout.
TEST(ServerCli, EveryForgeryGivesTheOneAnswer) {
  const std::string app = dataPath("dispatch_app_key_1024.pem"), enc = dataPath("dispatch_enc_key_2048.pem");
  const std::string salted = server::saltedHashValue("hello", "pepper", 'S');
  std::string sha1 = toHex(opensslSha1("hello"));
  std::transform(sha1.begin(), sha1.end(), sha1.begin(), ::toupper);
  std::string type5 = pkcs1(encKey(), sha1);
  std::reverse(type5.begin(), type5.end());
  const struct {
    int type;
    std::string payload;  // after "S" kTs ":" (88: the whole content; direct types: the output)
    bool salt = false;
  } types[] = {
      {0, "hello"}, {1, "hello"}, {48, "hello"}, {48, salted, true}, {88, "hello"},
      {47, hexOf(pkcs1(encKey(), salted)), true}, {2, hexOf(keyou(encKey()))}, {12, b64Of(keyou(encKey()))},
      {10, hexOf(pkcs1(encKey(), "hello"))}, {8, hexOf(pkcs1(encKey(), kPair))}, {46, b64Of(pkcs1(encKey(), kPair))},
      {5, hexOf(type5) + "0001"}, {19, hexOf(pkcs1(encKey(), "01105hello"))},
      {30, hexOf(pkcs1(encKey(), "hello"))}, {22, hexOf(pkcs1(encKey(), kPair))}, {4, b64Of(pkcs1(encKey(), kPair))},
      {29, hexOf(keyou(encKey()))}, {3, b64Of(keyou(encKey()))}, {56, hexOf(pkcs1(appKey(), "hello"))},
      {73, b64Of(pkcs1(appKey(), "hello"))},
  };
  const std::string badBlock = text(opensslRawEncrypt(appKey(), block(appKey(), fromHex("0001"), 3)));
  const Bytes otherKey = fromHex("ffeeddccbbaa99887766554433221100"), shortKey(kRc4Key.begin(), kRc4Key.end() - 1);
  for (const auto& t : types) {
    const server::TypeLayout layout = server::typeLayout(t.type);
    const bool direct = layout.outer == server::Outer::DirectWithEnc || layout.outer == server::Outer::DirectWithApp;
    const server::PrivateKey& directKey = layout.outer == server::Outer::DirectWithApp ? appKey() : encKey();
    const std::string content = t.type == 88 ? t.payload : "S" + kTs + ":" + t.payload;
    auto envelope = [&](const Bytes& key, const std::string& wrapped) {
      return opensslEnvelope(appKey(), key, layout.drop, content, bytesOf(wrapped));
    };
    const std::string valid = direct ? t.payload : envelope(kRc4Key, pkcs1(appKey(), text(kRc4Key)));
    struct Row {
      const char* what;
      std::string output;
      std::vector<std::string> extra;
    };
    std::vector<Row> rows = {{"valid", valid, {}}, {"wrong password", valid, {"--password", "hellO"}}};
    if (direct) {
      const bool b64 = t.payload.find_first_not_of("0123456789abcdef") != std::string::npos;
      const std::string forged = text(opensslRawEncrypt(directKey, block(directKey, fromHex("0001"), 3)));
      rows.push_back({"bad padding", b64 ? b64Of(forged) : hexOf(forged), {}});
      const std::string above(directKey.size(), '\xff');  // not below the modulus
      rows.push_back({"value above the modulus", b64 ? b64Of(above) : hexOf(above), {}});
    } else {
      rows.push_back({"bad padding", envelope(kRc4Key, badBlock), {}});
      rows.push_back({"wrong-length key", envelope(shortKey, pkcs1(appKey(), text(shortKey))), {}});
      rows.push_back({"value above the modulus", envelope(kRc4Key, std::string(appKey().size(), '\xff')), {}});
      rows.push_back({"wrong 16-byte key", envelope(kRc4Key, pkcs1(appKey(), text(otherKey))), {}});
      rows.push_back({"wrong type", valid, {"--type", t.type == 10 ? "2" : "10"}});
    }
    const bool timestamped = layout.outer == server::Outer::WrappedEnvelope || t.type == 4 || t.type == 22;
    if (timestamped) rows.push_back({"wrong timestamp", valid, {"--timestamp", "2024-01-01 12:00:01"}});
    for (const Row& r : rows) {
      std::vector<std::string> args = {"--type", std::to_string(t.type), "--key", app, "--enc-key", enc,
                                       "--password", "hello"};
      if (timestamped) args.insert(args.end(), {"--timestamp", kTs});
      if (t.salt) args.insert(args.end(), {"--salt", "pepper"});
      args.insert(args.end(), r.extra.begin(), r.extra.end());  // later options win
      args.push_back(r.output);
      const CliRun run = runOpenCli(args);
      const std::string where = std::to_string(t.type) + ", " + r.what;
      if (std::string(r.what) == "valid") {
        EXPECT_EQ(run.status, 0) << where << ": " << run.err;
        EXPECT_NE(run.out.find("content: "), std::string::npos) << where;
        EXPECT_NE(run.out.find("password: match\n"), std::string::npos) << where;
      } else {
        EXPECT_EQ(run.status, 3) << where << ": " << run.err;
        EXPECT_EQ(run.out + run.err, "tessel_open: output rejected\n") << where;
      }
    }
  }
  // Another type's content, its payload left sealed (no encryption key): the shape check answers.
  const CliRun sealed = runOpenCli({"--type", "47", "--key", app, opensslEnvelope(appKey(), kRc4Key, 512, "S1:hello")});
  EXPECT_EQ(sealed.status * 1000 + sealed.out.size(), 3000u) << sealed.err;
  EXPECT_EQ(sealed.err, "tessel_open: output rejected\n");
}

// Without a timestamp: hex and base64 payloads split at the last ':', plain text at the first;
// with the expected timestamp, right after it whatever the payload holds.
TEST(ServerPayloads, SplitRule) {
  const struct {
    std::string content;
    bool encoded;
    std::string expected, fields;  // fields "" : rejected
  } rows[] = {
      {"S1700000000:pay:load", false, "", "S|1700000000|pay:load"},
      {"S2024-01-01 12:00:00:0A1B", true, "", "S|2024-01-01 12:00:00|0A1B"},
      {"S2024-01-01 12:00:00:pw:x", false, "", "S|2024-01-01 12|00:00:pw:x"},
      {"S2024-01-01 12:00:00:pw:x", false, kTs, "S|2024-01-01 12:00:00|pw:x"},
      {"S2024-01-01 12:00:00:pw:x", true, kTs, "S|2024-01-01 12:00:00|pw:x"},
      {"S2024-01-01 12:00:01:pw", false, kTs, ""}, {"S2024-01-01 12:00:00", false, kTs, ""},
      {"S123", false, "", ""}, {"X123:abc", true, "", ""}, {":123", true, "", ""}, {"", false, "", ""},
  };
  for (const auto& r : rows) {
    server::Wrapped w;
    std::string error;
    const bool ok = server::splitWrapped(r.content, &w, &error, r.encoded, r.expected);
    EXPECT_EQ(ok ? std::string(1, w.strength) + "|" + w.timestamp + "|" + w.payload : error,
              r.fields.empty() ? "output rejected" : r.fields) << r.content;
  }
}

// Length-prefixed pairs: "%02d" is two digits below 100 and three from 100 on.
TEST(ServerPayloads, LengthPrefixedPairs) {
  const struct {
    std::string pair, fields;  // "" : rejected
  } rows[] = {
      {"041700041234", "1700|1234"}, {"0000", "|"}, {"02ab100" + std::string(100, 't'), "ab|" + std::string(100, 't')},
      {"0417000510pw", ""}, {"041700021", ""}, {"0417000212345", ""}, {"x", ""},
  };
  for (const auto& r : rows) {
    std::string ts, text, error;
    const bool ok = server::parseLengthPrefixedPair(r.pair, &ts, &text, &error);
    EXPECT_EQ(ok ? ts + "|" + text : error, r.fields.empty() ? "output rejected" : r.fields) << r.pair;
  }
}

TEST(ServerPayloads, SaltedHashesKnownAnswers) {
  // Values computed with Python's hashlib: md5(md5(p).hexdigest() + salt).hexdigest().
  EXPECT_EQ(server::saltedHashValue("pw", "salt", 'S'), "c359e5975c5a3f45");
  EXPECT_EQ(server::saltedHashValue("pw", "salt", 'F'), "38b311d8c359e5975c5a3f454d3f4294");
  EXPECT_EQ(server::saltedHashValue("Passw0rd!", "::x::", 'F'), "f061fc492d56eb9b8e2dfe6bdd59f73c");
  EXPECT_EQ(server::saltedHashValue("pw", "salt", 'X'), "");
}

// getNativeEncryptedPinCode's value: RC4 under SHA-1 of the challenge (up to its first zero).
TEST(ServerCli, OpensEncryptedPinCodesAndReadsSecretsFromFiles) {
  const std::string code = opensslBase64(opensslRc4(opensslSha1("chal"), bytesOf("1234")));
  std::string pin, error;
  ASSERT_TRUE(server::openEncryptedPinCode(std::string("chal\0junk", 9), code, &pin, &error)) << error;
  EXPECT_EQ(pin, "1234");
  const std::string pw = outputPath("pw.txt"), big = outputPath("big.txt");
  std::ofstream(pw) << "1234\r\n";
  std::ofstream(big) << std::string(4097, 'x');
  const struct {
    std::vector<std::string> args;
    std::string input;
    int status;
    std::string out;
  } rows[] = {
      {{"--challenge", "chal", code}, "", 0, "content: 1234\n"},
      {{"--challenge", "chal", "--password-file", pw, code}, "", 0, "content: 1234\npassword: match\n"},
      {{"--challenge", "chal", "--password-file", "-", code}, "1234\n", 0, "content: 1234\npassword: match\n"},
      {{"--challenge-file", pw, "--password", "1234", code}, "", 3, ""},  // challenge "1234"
      {{"--challenge", "chal", "--password", "1235", code}, "", 3, ""},
      {{"--challenge", "chal", "--password-file", "-", "-"}, code, 2, ""},
      {{"--challenge", "chal", "--password-file", big, code}, "", 2, ""},
      {{"--challenge", "chal", "--password-file", "/nonexistent", code}, "", 2, ""},
      {{"--challenge", "chal", code + "x"}, "", 1, ""},
      {{"--challenge", "chal", "-"}, std::string(65537, 'A') + "\n", 1, ""},
  };
  for (const auto& r : rows) {
    const CliRun run = runOpenCli(r.args, r.input);
    EXPECT_EQ(run.status, r.status) << r.args[2] << ": " << run.err;
    EXPECT_EQ(run.out, r.out) << r.args[2];
  }
}

}  // namespace
}  // namespace tessel::test
