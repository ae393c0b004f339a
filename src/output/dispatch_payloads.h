// Payloads of the dispatcher's dedicated encryption types: 5 (reversed SHA-1 RSA), 19 (length
// tagged RSA), 38 (triple-DES PIN with an RSA-wrapped key), 68 (key-hierarchy PIN) and the
// salted-hash types 47, 48, 55, 59. Internal to the dispatcher (and its tests); the shared
// library exports none of it.
//
// Each builder takes the encryption-platform modulus (hex) and the NUL-terminated text, returns
// an ErrorCode, and on success sets *payload; types 68 and the hashed ones also set *rated to
// the part of the text the strength letter is computed over (absent = the whole text).
// Keys, blocks, digests and their hex forms are wiped on every path.
#pragma once

#include "crypto/error_table.h"
#include "crypto/secure_buffer.h"

namespace tessel {

// SHA-1(text) as 40 hex chars -> PKCS#1 RSA -> bytes reversed -> hex, then "0001".
ErrorCode type5Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept;

// "011", "%02d" of the length, the text bytes -> PKCS#1 RSA -> hex.
ErrorCode type19Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept;

// At most 12 digits (else 5): F-padded block, triple-DES under a fresh random key (parity set),
// 16 hex chars, then PKCS#1 RSA hex of DER SEQUENCE { OCTET STRING key, OCTET STRING 99 x 8 }.
ErrorCode type38Payload(const char* enc, const char* text, SecureBuffer* payload) noexcept;

// Text "F" "::::::::::" A(32 hex) "::::::::::" B(32 hex) "::::::::::" C(<= 12), else 18.
// working key = 3DES-decrypt(master(F), A); PIN key = 3DES-decrypt(working, B);
// payload = PKCS#1 RSA hex of 3DES-encrypt(PIN key, ISO 9564 format 0 block of C). *rated = C.
ErrorCode type68Payload(const char* enc, const char* text, SecureBuffer* payload, SecureBuffer* rated) noexcept;

// Types 47, 55 (payload = PKCS#1 RSA hex of the value) and 48, 59 (the value itself).
// A text without "::::::::::" is its own value. Otherwise it reads P "::::::::::" salt
// "::::::::::" mode, as the session appends the hash-random suffix: P non-empty, the salt runs
// from the first separator to the last 11 characters, the character after the next separator
// is 'S' or 'F' (else 18). value = MD5hex(MD5hex(P) salt) (lower case), characters 8..23 for
// 'S', all 32 for 'F'. *rated = P when the text has a salt.
ErrorCode hashedPayload(int type, const char* enc, const char* text, SecureBuffer* payload,
                        SecureBuffer* rated) noexcept;

// The 16-byte master PIN key picked by the text's first character (selector '0' or not),
// assembled from the deployment's fragments. 16 when the configured key is not 32 hex digits.
ErrorCode masterPinKey(char selector, SecureBuffer* key) noexcept;

}  // namespace tessel
