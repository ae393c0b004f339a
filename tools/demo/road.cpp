// Shared steps of the demo's two modes: check lines, keys, session settings, envelope opening.
#include "road.h"

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <ctime>

#include "session/session.h"
#include "session/settings.h"

namespace demo {

using namespace tessel;

const char kSalt[] = "8f3a2c91d7";

namespace {
int g_failures = 0;
}  // namespace

void step(const char* text) { std::printf("  %s\n", text); }

void check(bool ok, const char* what) {
  std::printf("  %s %s\n", ok ? "ok  " : "FAIL", what);
  if (!ok) ++g_failures;
}

int failures() { return g_failures; }

std::string sourcePath(const char* relative) { return std::string(TESSEL_SOURCE_DIR) + "/" + relative; }

bool BackendKeys::load(std::string* error) {
  return app.loadPemFile(sourcePath("tests/data/builtin_default_key.pem"), error) &&
         enc.loadPemFile(sourcePath("tools/demo/demo_encryption_key.pem"), error);
}

server::OpenKeys BackendKeys::openKeys() const {
  server::OpenKeys keys;
  keys.app = &app;
  keys.enc = &enc;
  return keys;
}

int createDemoSession(const server::PrivateKey& enc, bool shuffle) {
  const int handle = createSession("demo-login-password");
  KeyboardSession* s = sessionAt(handle);
  if (s == nullptr) return -1;
  std::printf("  createNativeSession(\"demo-login-password\") -> handle %d\n", handle);
  setAccepts(*s, "[[:alnum:][:punct:]]{1,16}");
  setMinLength(*s, 8);
  setMaxLength(*s, 16);
  setKbdRandom(*s, shuffle);
  setContentType(*s, 7);
  setDictionaryFilter(*s, "12345678,password,qwertyui");
  setHashRandom(*s, (std::string("1:") + kSalt).c_str());
  setEncryPlat(*s, enc.modulusHex().c_str(), false);
  step(shuffle ? "settings: accepts [[:alnum:][:punct:]]{1,16}, length 8..16, shuffled keys, digit+letter+symbol"
               : "settings: accepts [[:alnum:][:punct:]]{1,16}, length 8..16, fixed keys, digit+letter+symbol");
  step("required, a dictionary of forbidden passwords, a hash salt, a 2048-bit encryption key");
  return handle;
}

std::string utcTimestamp() {
  char timestamp[32];
  const std::time_t now = std::time(nullptr);
  std::tm utc{};
  gmtime_r(&now, &utc);
  std::strftime(timestamp, sizeof timestamp, "%Y%m%d%H%M%S", &utc);
  return timestamp;
}

bool openContent(const SecureBuffer& content, const server::OpenKeys& keys, server::Opened* opened) {
  std::string error = "no content output";
  const bool ok = content && server::openOutput(48, content.c_str(), keys, opened, &error);
  check(ok, ok ? "content envelope opened with the built-in default key" : ("content envelope: " + error).c_str());
  if (ok)
    std::printf("  strength '%c', timestamp %s, salted value %s\n", opened->strength, opened->timestamp.c_str(),
                opened->payload.c_str());
  return ok;
}

namespace {

// A path as the user types it from the repository root: relative when it lies inside it.
std::string fromRoot(const std::string& path) {
  char resolved[PATH_MAX], root[PATH_MAX];
  if (realpath(path.c_str(), resolved) == nullptr || realpath(TESSEL_SOURCE_DIR, root) == nullptr) return path;
  const std::string r = resolved, prefix = std::string(root) + "/";
  return r.compare(0, prefix.size(), prefix) == 0 ? r.substr(prefix.size()) : r;
}

std::string shellWord(const std::string& word) {
  if (!word.empty() && word.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_./-=") ==
                           std::string::npos)
    return word;
  std::string quoted = "'";
  for (char c : word) quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return quoted + "'";
}

}  // namespace

std::string saveForBackend(const std::string& dir, const char* name, int type, const SecureBuffer& output,
                           const char* password) {
  const std::string path = dir + "/" + name;
  FILE* file = output ? std::fopen(path.c_str(), "w") : nullptr;
  const bool written = file != nullptr && std::fprintf(file, "%s\n", output.c_str()) > 0;
  if (file != nullptr && std::fclose(file) != 0) return std::string();
  if (!written) return std::string();
  std::string command = shellWord(fromRoot(TESSEL_OPEN_PATH)) + " --type " + std::to_string(type) + " --key " +
                        shellWord(fromRoot(sourcePath("tests/data/builtin_default_key.pem")));
  if (type == 47) command += " --enc-key " + shellWord(fromRoot(sourcePath("tools/demo/demo_encryption_key.pem")));
  if (password != nullptr) command += " --password " + shellWord(password) + " --salt " + kSalt + " --mode S";
  return command + " - < " + shellWord(fromRoot(path));
}

}  // namespace demo
