// tessel_open: opens one output of the keyboard library on the command line, the way the bank's
// backend does it (tessel_opener.h has the library behind it).
//
//   tessel_open --type 48 --key app.pem --timestamp 20240101120000 OUTPUT
//   tessel_open --type 47 --key app.pem --enc-key enc.pem --password-file pw.txt --salt s OUTPUT
//   tessel_open --challenge-file challenge.txt OUTPUT        (getNativeEncryptedPinCode's value)
//
// On success it prints "field: value" lines (strength, timestamp, payload, content, password)
// on stdout and returns 0. On any failure it prints exactly one line "tessel_open: <reason>" on
// stderr and nothing on stdout, and returns one of the statuses below (docs/deployment.md has
// the same table). Secrets are best given as files (--password-file, --master-key-file,
// --pin-key-file, --challenge-file; "-" is stdin): any local user can read argv.
#pragma once

namespace tessel::server {

enum OpenStatus : int {
  kOpenOk = 0,                // opened (and the password matches, when one was given)
  kOpenBadOutput = 1,         // public bytes are wrong: too long, bad base64 or hex, bad layout,
                              // truncated, an RSA value of another key's size
  kOpenBadUsage = 2,          // options: unknown, missing or bad value, no OUTPUT, an unknown
                              // type, a key the type needs not given, an unreadable file
  kOpenRejected = 3,          // "output rejected": forged, wrong key inside, another type's
                              // output, not the expected timestamp, or a password mismatch
};

int openMain(int argc, char** argv);

}  // namespace tessel::server
