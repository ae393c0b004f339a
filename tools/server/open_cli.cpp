// The tessel_open command line (see open_cli.h), kept in the library so it can be exercised
// in-process as well as through the executable.
#include "server/open_cli.h"

#include <cstdio>
#include <cstdlib>
#include <string>

#include "server/bytes.h"
#include "server/encrypted_pin_code.h"
#include "server/password_check.h"
#include "server/payloads.h"
#include "server/tessel_opener.h"

namespace tessel::server {
namespace {

const char kUsage[] =
    "usage: tessel_open [--type N] --key APP.pem [--enc-key ENC.pem] [--timestamp TEXT]\n"
    "                   [--pin-key HEX | --master-key HEX --wrapped-working-key HEX --wrapped-pin-key HEX]\n"
    "                   [--password TEXT [--salt TEXT] [--mode S|F]] [--layout] OUTPUT|-\n"
    "       tessel_open --challenge TEXT [--password TEXT] OUTPUT|-\n"
    "  --type N      encryption type the output was made with (default 48)\n"
    "  --key         application-platform private key (opens envelopes, types 56 and 73)\n"
    "  --enc-key     encryption-platform private key (opens RSA payloads, types 3 4 22 29 30)\n"
    "  --timestamp   the timestamp the server issued: the content must carry exactly it\n"
    "  --pin-key     type 68: the 16-byte PIN key as 32 hex digits, or derive it from the\n"
    "                master key and the two wrapped keys the app was given\n"
    "  --password    check the opened content against a stored password: the salted MD5 value\n"
    "                for types 47 48 55 59 (with --salt and --mode; no --salt when the app set\n"
    "                no hash random), SHA-1 for type 5, the text itself for the other types\n"
    "  --salt        the app set this hash salt (types 48 and 59 then carry the hash as hex)\n"
    "  --challenge   open getNativeEncryptedPinCode's value made under this challenge code\n"
    "  --layout      only decode the envelope and print its field lengths\n"
    "  OUTPUT        the text returned by the library, or - to read it from stdin\n"
    "--password, --master-key, --pin-key and --challenge also come as --NAME-file PATH (the file's\n"
    "content less one final newline; - is stdin): prefer them, argv is readable by other users.\n"
    "Without --timestamp the wrapper is split at its last ':' when the payload is hex or base64\n"
    "(RSA types, and 48/59 with --salt), else at its first ':'.\n"
    "Exit status: 0 opened, 1 bad output bytes, 2 bad usage or unreadable file, 3 output rejected\n"
    "(forged, another type's output, another timestamp or a password mismatch: one answer).\n";

int failLine(const std::string& message, int code) {
  std::fprintf(stderr, "tessel_open: %s\n", message.c_str());
  return code;
}

// Content bytes are shown as text when printable, else as hex.
std::string printable(const std::string& s) {
  for (unsigned char c : s)
    if (c < 0x20 || c > 0x7E) return "hex:" + toHex(s, true);
  return s;
}

// A secret given inline or as a file; the file form drops one final "\n" or "\r\n".
struct Secret {
  explicit Secret(const char* n) : name(n) {}
  const char* name;
  std::string value, path;
  bool given = false, fromFile = false;
  ~Secret() { wipeString(&value); }
  bool load(bool outputOnStdin, std::string* error) {
    if (!fromFile) return true;
    if (path == "-" && outputOnStdin) return fail(error, std::string(name) + "-file - needs OUTPUT not on stdin");
    if (!readSecretFile(path, kMaxSecretFileBytes, &value, error)) return false;
    if (!value.empty() && value.back() == '\n') value.pop_back();
    if (!value.empty() && value.back() == '\r') value.pop_back();
    return true;
  }
};

struct Options {
  int type = 48;
  std::string keyPath, encPath, aHex, bHex, salt, timestamp, output;
  Secret password{"--password"};
  Secret masterHex{"--master-key"};
  Secret pinKeyHex{"--pin-key"};
  Secret challenge{"--challenge"};
  char mode = 'S';
  bool haveSalt = false, layoutOnly = false, haveOutput = false;
};

// Parses argv into *o; false with a message on bad usage.
bool parse(int argc, char** argv, Options* o, std::string* error, bool* help) {
  Secret* secrets[] = {&o->password, &o->masterHex, &o->pinKeyHex, &o->challenge};
  for (int k = 1; k < argc; ++k) {
    const std::string arg = argv[k];
    auto value = [&](std::string* into) {
      if (k + 1 >= argc) return fail(error, arg + " needs a value");
      *into = argv[++k];
      return true;
    };
    bool matched = false;
    for (Secret* s : secrets) {
      if (arg == s->name || arg == std::string(s->name) + "-file") {
        s->fromFile = arg != s->name;
        if (!value(s->fromFile ? &s->path : &s->value)) return false;
        s->given = matched = true;
      }
    }
    std::string v;
    if (matched) continue;
    if (arg == "--help" || arg == "-h") {
      *help = true;
      return true;
    } else if (arg == "--type") {
      if (!value(&v)) return false;
      char* end = nullptr;
      const long t = std::strtol(v.c_str(), &end, 10);
      if (v.empty() || *end != '\0' || t < -1000000 || t > 1000000) return fail(error, "--type needs a number");
      o->type = static_cast<int>(t);
    } else if (arg == "--key") {
      if (!value(&o->keyPath)) return false;
    } else if (arg == "--enc-key") {
      if (!value(&o->encPath)) return false;
    } else if (arg == "--wrapped-working-key") {
      if (!value(&o->aHex)) return false;
    } else if (arg == "--wrapped-pin-key") {
      if (!value(&o->bHex)) return false;
    } else if (arg == "--timestamp") {
      if (!value(&o->timestamp)) return false;
    } else if (arg == "--salt") {
      if (!value(&o->salt)) return false;
      o->haveSalt = true;
    } else if (arg == "--mode") {
      if (!value(&v)) return false;
      if (v != "S" && v != "F") return fail(error, "--mode is S or F");
      o->mode = v[0];
    } else if (arg == "--layout") {
      o->layoutOnly = true;
    } else if (!arg.empty() && arg[0] == '-' && arg != "-") {
      return fail(error, "unknown option " + arg + " (see --help)");
    } else if (o->haveOutput) {
      return fail(error, "more than one OUTPUT given");
    } else {
      o->haveOutput = true;
      o->output = arg;
    }
  }
  if (!o->haveOutput) return fail(error, "no OUTPUT given (see --help)");
  for (Secret* s : secrets)
    if (!s->load(o->output == "-", error)) return false;
  if (o->challenge.given && o->challenge.value.empty()) return fail(error, "the challenge code is empty");
  return true;
}

// What was opened, on stdout: only once the password (when given) matched.
void printOpened(const Opened& opened) {
  if (opened.wrapped) {
    std::printf("strength: %c\ntimestamp: %s\npayload: %s\n", opened.strength, opened.timestamp.c_str(),
                printable(opened.payload).c_str());
  } else if (!opened.timestamp.empty()) {
    std::printf("timestamp: %s\n", opened.timestamp.c_str());
  }
  if (opened.contentOpened) std::printf("content: %s\n", printable(opened.content).c_str());
}

int run(Options& o) {
  std::string error;
  // At most 65536 bytes and one more are read: the cap below refuses the rest unread.
  if (o.output == "-" && !readAtMost("-", kMaxOutputBytes + 1, &o.output, &error)) return failLine(error, kOpenBadUsage);
  while (!o.output.empty() && (o.output.back() == '\n' || o.output.back() == '\r' || o.output.back() == ' '))
    o.output.pop_back();

  if (o.layoutOnly) {
    EnvelopeLayout layout;
    if (!parseEnvelope(o.output, &layout, &error)) return failLine(error, kOpenBadOutput);
    std::printf("key-blob-length: %zu\nrsa-length: %zu\ncontent-length: %zu\ntotal-length: %zu\n",
                layout.keyBlobLength, layout.rsaLength, layout.contentLength, layout.totalLength);
    return kOpenOk;
  }

  Opened opened;
  if (o.challenge.given) {
    if (!openEncryptedPinCode(o.challenge.value, o.output, &opened.content, &error))
      return failLine(error, kOpenBadOutput);
    opened.contentOpened = true;
  } else {
    PrivateKey app, enc;
    OpenKeys keys;
    const TypeLayout layout = typeLayout(o.type);
    if (layout.outer == Outer::Unknown)
      return failLine("encryption type " + std::to_string(o.type) + " produces no output", kOpenBadUsage);
    const bool timestamped = layout.outer == Outer::WrappedEnvelope || layout.inner == Inner::PairPkcs1Hex ||
                             layout.inner == Inner::PairPkcs1Base64;
    if (!o.timestamp.empty() && !timestamped)
      return failLine("type " + std::to_string(o.type) + " carries no timestamp", kOpenBadUsage);
    if (layout.outer == Outer::DirectWithEnc ? o.encPath.empty() : o.keyPath.empty())
      return failLine(std::string("type ") + std::to_string(o.type) + " needs " +
                          (layout.outer == Outer::DirectWithEnc ? "--enc-key" : "--key") + " (see --help)",
                      kOpenBadUsage);
    if (!o.keyPath.empty()) {
      if (!app.loadPemFile(o.keyPath, &error)) return failLine(error, kOpenBadUsage);
      keys.app = &app;
    }
    if (!o.encPath.empty()) {
      if (!enc.loadPemFile(o.encPath, &error)) return failLine(error, kOpenBadUsage);
      keys.enc = &enc;
    }
    keys.saltedHash = o.haveSalt;
    keys.expectedTimestamp = o.timestamp;
    Wiped w{keys.pinKey};
    if (o.pinKeyHex.given) {
      if (o.pinKeyHex.value.size() != 32 || !fromHex(o.pinKeyHex.value, &keys.pinKey, "--pin-key", nullptr))
        return failLine("--pin-key must be 32 hex digits", kOpenBadUsage);
    } else if (o.masterHex.given || !o.aHex.empty() || !o.bHex.empty()) {
      if (!derivePinKey68(o.masterHex.value, o.aHex, o.bHex, &keys.pinKey, &error))
        return failLine(error, kOpenBadUsage);
    }
    if (!openOutput(o.type, o.output, keys, &opened, &error))
      return failLine(error, error == kRejected ? kOpenRejected : kOpenBadOutput);
  }
  if (!o.password.given) {
    printOpened(opened);
    return kOpenOk;
  }
  if (!opened.contentOpened) return failLine("the payload is sealed: give --enc-key", kOpenBadUsage);
  if (!matchesPassword(o.challenge.given ? -1 : o.type, opened, o.password.value, o.salt, o.mode))
    return failLine(kRejected, kOpenRejected);
  printOpened(opened);
  std::printf("password: match\n");
  return kOpenOk;
}

}  // namespace

int openMain(int argc, char** argv) {
  Options o;
  std::string error;
  bool help = false;
  if (!parse(argc, argv, &o, &error, &help)) return failLine(error, kOpenBadUsage);
  if (help) {
    std::fputs(kUsage, stdout);
    return kOpenOk;
  }
  return run(o);
}

}  // namespace tessel::server
