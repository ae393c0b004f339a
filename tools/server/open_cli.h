// tessel_open: opens one output of the keyboard library on the command line, the way the bank's
// backend does it (envelope.h has the library behind it).
//
//   tessel_open --type 48 --key app.pem OUTPUT
//   tessel_open --type 47 --key app.pem --enc-key enc.pem --password pw --salt s --mode S OUTPUT
//
// On success it prints "field: value" lines (strength, timestamp, payload, content, password)
// on stdout and returns 0. On any failure it prints exactly one line "tessel_open: <reason>" on
// stderr and returns one of the statuses below (docs/deployment.md has the same table).
#pragma once

namespace tessel::server {

enum OpenStatus : int {
  kOpenOk = 0,                // opened (and the password matches, when one was given)
  kOpenBadOutput = 1,         // the output is corrupt, truncated, foreign or of another type
  kOpenBadUsage = 2,          // options: unknown, missing or bad value, no OUTPUT, an unknown
                              // type, a key the type needs not given, an unreadable key file
  kOpenPasswordMismatch = 3,  // opened, but not made from the stored password
};

int openMain(int argc, char** argv);

}  // namespace tessel::server
