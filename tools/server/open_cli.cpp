// The tessel_open command line (see open_cli.h), kept in the library so it can be exercised
// in-process as well as through the executable.
#include "server/open_cli.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <iterator>
#include <string>

#include "server/envelope.h"

namespace tessel::server {
namespace {

const char kUsage[] =
    "usage: tessel_open [--type N] --key APP.pem [--enc-key ENC.pem]\n"
    "                   [--pin-key HEX | --master-key HEX --wrapped-working-key HEX --wrapped-pin-key HEX]\n"
    "                   [--password TEXT [--salt TEXT] [--mode S|F]] [--layout] OUTPUT|-\n"
    "  --type N      encryption type the output was made with (default 48)\n"
    "  --key         application-platform private key (opens envelopes, types 56 and 73)\n"
    "  --enc-key     encryption-platform private key (opens RSA payloads, types 3 4 22 29 30)\n"
    "  --pin-key     type 68: the 16-byte PIN key as 32 hex digits, or derive it from the\n"
    "                master key and the two wrapped keys the app was given\n"
    "  --password    check the opened content against a stored password: the salted MD5 value\n"
    "                for types 47 48 55 59 (with --salt and --mode; no --salt when the app set\n"
    "                no hash random), SHA-1 for type 5, the text itself for the other types\n"
    "  --layout      only decode the envelope and print its field lengths\n"
    "  OUTPUT        the text returned by the library, or - to read it from stdin\n"
    "The wrapper is split at its last ':' when the payload is hex or base64 (RSA types, and 48/59\n"
    "with --salt), else at its first ':', so plain-text outputs need a timestamp without ':'.\n"
    "Exit status: 0 opened, 1 bad, foreign or other-type output, 2 bad usage or unreadable key,\n"
    "3 password mismatch.\n";

int failLine(const std::string& message, int code = kOpenBadOutput) {
  std::fprintf(stderr, "tessel_open: %s\n", message.c_str());
  return code;
}

// Content bytes are shown as text when printable, else as hex.
std::string printable(const std::string& s) {
  for (unsigned char c : s)
    if (c < 0x20 || c > 0x7E) {
      static const char digits[] = "0123456789ABCDEF";
      std::string hex = "hex:";
      for (unsigned char b : s) {
        hex += digits[b >> 4];
        hex += digits[b & 15];
      }
      return hex;
    }
  return s;
}

std::string trimmed(std::string s) {
  while (!s.empty() && (s.back() == '\n' || s.back() == '\r' || s.back() == ' ')) s.pop_back();
  return s;
}

}  // namespace

int openMain(int argc, char** argv) {
  int type = 48;
  std::string keyPath, encPath, pinKeyHex, masterHex, aHex, bHex, password, salt, output;
  char mode = 'S';
  bool havePassword = false, haveSalt = false, layoutOnly = false, haveOutput = false;
  for (int k = 1; k < argc; ++k) {
    const std::string arg = argv[k];
    auto value = [&](std::string* into) {
      if (k + 1 >= argc) return false;
      *into = argv[++k];
      return true;
    };
    std::string v;
    if (arg == "--help" || arg == "-h") {
      std::fputs(kUsage, stdout);
      return kOpenOk;
    } else if (arg == "--type") {
      if (!value(&v)) return failLine("--type needs a value", kOpenBadUsage);
      char* end = nullptr;
      const long t = std::strtol(v.c_str(), &end, 10);
      if (v.empty() || *end != '\0' || t < -1000000 || t > 1000000) return failLine("--type needs a number", kOpenBadUsage);
      type = static_cast<int>(t);
    } else if (arg == "--key") {
      if (!value(&keyPath)) return failLine("--key needs a file", kOpenBadUsage);
    } else if (arg == "--enc-key") {
      if (!value(&encPath)) return failLine("--enc-key needs a file", kOpenBadUsage);
    } else if (arg == "--pin-key") {
      if (!value(&pinKeyHex)) return failLine("--pin-key needs a value", kOpenBadUsage);
    } else if (arg == "--master-key") {
      if (!value(&masterHex)) return failLine("--master-key needs a value", kOpenBadUsage);
    } else if (arg == "--wrapped-working-key") {
      if (!value(&aHex)) return failLine("--wrapped-working-key needs a value", kOpenBadUsage);
    } else if (arg == "--wrapped-pin-key") {
      if (!value(&bHex)) return failLine("--wrapped-pin-key needs a value", kOpenBadUsage);
    } else if (arg == "--password") {
      if (!value(&password)) return failLine("--password needs a value", kOpenBadUsage);
      havePassword = true;
    } else if (arg == "--salt") {
      if (!value(&salt)) return failLine("--salt needs a value", kOpenBadUsage);
      haveSalt = true;
    } else if (arg == "--mode") {
      if (!value(&v) || (v != "S" && v != "F")) return failLine("--mode is S or F", kOpenBadUsage);
      mode = v[0];
    } else if (arg == "--layout") {
      layoutOnly = true;
    } else if (!arg.empty() && arg[0] == '-' && arg != "-") {
      return failLine("unknown option " + arg + " (see --help)", kOpenBadUsage);
    } else if (haveOutput) {
      return failLine("more than one OUTPUT given", kOpenBadUsage);
    } else {
      haveOutput = true;
      output = arg;
    }
  }
  if (!haveOutput) return failLine("no OUTPUT given (see --help)", kOpenBadUsage);
  if (output == "-") output.assign(std::istreambuf_iterator<char>(std::cin), std::istreambuf_iterator<char>());
  output = trimmed(output);
  if (haveSalt && !havePassword) return failLine("--salt needs --password", kOpenBadUsage);

  std::string error;
  if (layoutOnly) {
    EnvelopeLayout layout;
    if (!parseEnvelope(output, &layout, &error)) return failLine(error);
    std::printf("key-blob-length: %zu\nrsa-length: %zu\ncontent-length: %zu\ntotal-length: %zu\n",
                layout.keyBlobLength, layout.rsaLength, layout.contentLength, layout.totalLength);
    return kOpenOk;
  }

  PrivateKey app, enc;
  OpenKeys keys;
  const TypeLayout layout = typeLayout(type);
  if (layout.outer == Outer::Unknown)
    return failLine("encryption type " + std::to_string(type) + " produces no output", kOpenBadUsage);
  if (layout.outer == Outer::DirectWithEnc ? encPath.empty() : keyPath.empty())
    return failLine(std::string("type ") + std::to_string(type) + " needs " +
                        (layout.outer == Outer::DirectWithEnc ? "--enc-key" : "--key") + " (see --help)",
                    kOpenBadUsage);
  if (!keyPath.empty()) {
    if (!app.loadPemFile(keyPath, &error)) return failLine(error, kOpenBadUsage);
    keys.app = &app;
  }
  if (!encPath.empty()) {
    if (!enc.loadPemFile(encPath, &error)) return failLine(error, kOpenBadUsage);
    keys.enc = &enc;
  }
  keys.saltedHash = haveSalt;
  if (!pinKeyHex.empty()) {
    if (pinKeyHex.size() != 32 || pinKeyHex.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
      return failLine("--pin-key must be 32 hex digits", kOpenBadUsage);
    for (std::size_t k = 0; k < 32; k += 2)
      keys.pinKey += static_cast<char>(std::stoi(pinKeyHex.substr(k, 2), nullptr, 16));
  } else if (!masterHex.empty() || !aHex.empty() || !bHex.empty()) {
    if (!derivePinKey68(masterHex, aHex, bHex, &keys.pinKey, &error)) return failLine(error, kOpenBadUsage);
  }

  Opened opened;
  if (!openOutput(type, output, keys, &opened, &error)) return failLine(error);
  if (opened.wrapped) {
    std::printf("strength: %c\ntimestamp: %s\npayload: %s\n", opened.strength, opened.timestamp.c_str(),
                printable(opened.payload).c_str());
  } else if (!opened.timestamp.empty()) {
    std::printf("timestamp: %s\n", opened.timestamp.c_str());
  }
  if (opened.contentOpened) std::printf("content: %s\n", printable(opened.content).c_str());
  int status = kOpenOk;
  if (havePassword) {
    if (!opened.contentOpened) return failLine("the payload is sealed: give --enc-key", kOpenBadUsage);
    const bool match = matchesPassword(type, opened, password, salt, mode);
    std::printf("password: %s\n", match ? "match" : "mismatch");
    if (!match) status = failLine("the password does not match", kOpenPasswordMismatch);
  }
  wipeString(&opened.content);
  wipeString(&keys.pinKey);
  wipeString(&password);
  return status;
}

}  // namespace tessel::server
