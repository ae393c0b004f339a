// OpenSSL oracles for the dispatcher suites. Each throws std::runtime_error when OpenSSL fails,
// which GoogleTest reports as a test failure.
#include "support/dispatch_oracle.h"

#include <openssl/encoder.h>
#include <openssl/evp.h>
#include <openssl/rsa.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <map>
#include <mutex>
#include <stdexcept>

#include "server/open_cli.h"

namespace tessel::test {

const server::PrivateKey& testKey(const std::string& fileName) {
  static std::mutex lock;
  static auto* keys = new std::map<std::string, server::PrivateKey>();  // process lifetime
  std::lock_guard<std::mutex> hold(lock);
  auto it = keys->find(fileName);
  if (it == keys->end()) {
    server::PrivateKey key;
    std::string error;
    if (!key.loadPemFile(dataPath(fileName), &error)) throw std::runtime_error(error);
    it = keys->emplace(fileName, std::move(key)).first;
  }
  return it->second;
}

Bytes opensslBase64Decode(const std::string& text) {
  Bytes out(text.size() / 4 * 3 + 1);
  const int n = EVP_DecodeBlock(out.data(), reinterpret_cast<const unsigned char*>(text.data()),
                                static_cast<int>(text.size()));
  if (n < 0 || text.size() % 4 != 0) throw std::runtime_error("base64");
  // EVP_DecodeBlock keeps the bytes that "=" padding stands for; drop them.
  std::size_t pad = 0;
  if (!text.empty() && text.back() == '=') ++pad;
  if (text.size() > 1 && text[text.size() - 2] == '=') ++pad;
  out.resize(static_cast<std::size_t>(n) - pad);
  return out;
}

namespace {
Bytes rsa(const server::PrivateKey& key, const Bytes& in, int padding, bool encrypt) {
  EVP_PKEY_CTX* ctx = EVP_PKEY_CTX_new(key.get(), nullptr);
  auto run = encrypt ? EVP_PKEY_encrypt : EVP_PKEY_decrypt;
  std::size_t n = 0;
  bool ok = ctx != nullptr && (encrypt ? EVP_PKEY_encrypt_init(ctx) : EVP_PKEY_decrypt_init(ctx)) == 1 &&
            EVP_PKEY_CTX_set_rsa_padding(ctx, padding) == 1 && run(ctx, nullptr, &n, in.data(), in.size()) == 1;
  Bytes out(n);
  ok = ok && run(ctx, out.data(), &n, in.data(), in.size()) == 1;
  EVP_PKEY_CTX_free(ctx);
  if (!ok) throw std::runtime_error(encrypt ? "RSA encryption" : "RSA decryption");
  out.resize(n);
  return out;
}
}  // namespace

Bytes opensslPkcs1Encrypt(const server::PrivateKey& key, const Bytes& m) {
  return rsa(key, m, RSA_PKCS1_PADDING, true);
}
Bytes opensslRawEncrypt(const server::PrivateKey& key, const Bytes& b) { return rsa(key, b, RSA_NO_PADDING, true); }
Bytes opensslRawDecrypt(const server::PrivateKey& key, const Bytes& c) { return rsa(key, c, RSA_NO_PADDING, false); }
Bytes opensslPkcs1Decrypt(const server::PrivateKey& key, const Bytes& c) {
  return rsa(key, c, RSA_PKCS1_PADDING, false);
}

std::string opensslPublicDerHex(const server::PrivateKey& key) {
  unsigned char* der = nullptr;
  std::size_t len = 0;
  OSSL_ENCODER_CTX* ctx = OSSL_ENCODER_CTX_new_for_pkey(key.get(), EVP_PKEY_PUBLIC_KEY, "DER", "pkcs1", nullptr);
  const bool ok = ctx != nullptr && OSSL_ENCODER_to_data(ctx, &der, &len) == 1;
  OSSL_ENCODER_CTX_free(ctx);
  if (!ok) throw std::runtime_error("public key DER");
  std::string hex = toHex(Bytes(der, der + len));
  OPENSSL_free(der);
  for (char& ch : hex) ch = static_cast<char>(std::toupper(static_cast<unsigned char>(ch)));
  return hex;
}

std::string opensslEnvelope(const server::PrivateKey& key, const Bytes& rc4Key, std::size_t drop,
                            const std::string& content, const Bytes& wrappedKey) {
  Bytes wrapped = wrappedKey.empty() ? opensslPkcs1Encrypt(key, rc4Key) : wrappedKey;
  std::reverse(wrapped.begin(), wrapped.end());
  char digits[32];
  Bytes raw;
  std::snprintf(digits, sizeof digits, "%08zu", wrapped.size() + 12);
  raw.insert(raw.end(), digits, digits + 8);
  const unsigned char header[12] = {0x01, 0x02, 0x00, 0x00, 0x01, 0x68, 0x00, 0x00, 0x00, 0xA4, 0x00, 0x00};
  raw.insert(raw.end(), header, header + 12);
  raw.insert(raw.end(), wrapped.begin(), wrapped.end());
  std::snprintf(digits, sizeof digits, "%08zu", content.size());
  raw.insert(raw.end(), digits, digits + 8);
  const Bytes sealed = opensslRc4(rc4Key, bytesOf(content), drop);
  raw.insert(raw.end(), sealed.begin(), sealed.end());
  return opensslBase64(raw);
}

std::string expectedSaltedHash(const std::string& password, const std::string& salt, char mode) {
  const std::string h2 = opensslMd5Hex(opensslMd5Hex(password) + salt);
  return mode == 'S' ? h2.substr(8, 16) : h2;
}

CliRun runOpenCli(const std::vector<std::string>& args, const std::string& input) {
  static int serial = 0;
  const std::string base = outputPath("cli_" + std::to_string(getpid()) + "_" + std::to_string(serial++));
  const std::string inPath = base + ".in", outPath = base + ".out", errPath = base + ".err";
  std::ofstream(inPath, std::ios::binary) << input;
  std::fflush(nullptr);
  const pid_t pid = fork();
  if (pid < 0) throw std::runtime_error("fork");
  if (pid == 0) {
    if (!std::freopen(inPath.c_str(), "rb", stdin) || !std::freopen(outPath.c_str(), "wb", stdout) ||
        !std::freopen(errPath.c_str(), "wb", stderr))
      _exit(120);
    std::vector<std::string> copies = args;
    std::vector<char*> argv;
    static char name[] = "tessel_open";
    argv.push_back(name);
    for (auto& a : copies) argv.push_back(&a[0]);
    argv.push_back(nullptr);
    const int code = server::openMain(static_cast<int>(argv.size()) - 1, argv.data());
    std::fflush(nullptr);
    _exit(code);
  }
  int status = 0;
  waitpid(pid, &status, 0);
  CliRun run;
  run.status = WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
  auto slurp = [](const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  };
  run.out = slurp(outPath);
  run.err = slurp(errPath);
  std::remove(inPath.c_str());
  std::remove(outPath.c_str());
  std::remove(errPath.c_str());
  return run;
}

}  // namespace tessel::test
