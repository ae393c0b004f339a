// tessel_open: opens one output of the keyboard library on the command line, the way the bank's
// backend does it (envelope.h has the library behind it).
//
//   tessel_open --type 48 --key app.pem OUTPUT
//   tessel_open --type 47 --key app.pem --enc-key enc.pem --password pw --salt s --mode S OUTPUT
//
// On success it prints "field: value" lines (strength, timestamp, payload, content, password)
// on stdout and returns 0. On any failure it prints exactly one line "tessel_open: <reason>" on
// stderr and returns 1 (bad or foreign output), 2 (bad usage) or 3 (password mismatch).
#pragma once

namespace tessel::server {

int openMain(int argc, char** argv);

}  // namespace tessel::server
