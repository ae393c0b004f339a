// The payloads inside an envelope (or bare, for the direct types), opened with the
// encryption-platform key unless the type says otherwise.
//
// Every failure once the private key has run reads kRejected ("output rejected"): RSA blocks go
// through implicit rejection (pem_keys.h), "Keyou" blocks are parsed with masks over the whole
// block and replaced by a synthetic message when invalid, and a layout that does not match after
// that fails with the one message. Messages for the encoded value itself (hex, base64, RSA length)
// name the value, never its bytes; the caller decides whether that value was public.
#pragma once

#include <string>

#include "server/pem_keys.h"
#include "server/types.h"

namespace tessel::server {

// RSA PKCS#1 v1.5 values as hex or base64 -> the message (any length).
bool openPkcs1Hex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error);
bool openPkcs1Base64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error);
// Raw RSA "Keyou" blocks as hex or base64 -> the message.
bool openKeyouHex(const PrivateKey& key, const std::string& hex, std::string* plain, std::string* error);
bool openKeyouBase64(const PrivateKey& key, const std::string& b64, std::string* plain, std::string* error);
// "%02d" widths are two digits below 100 and three from 100 on; the reading that consumes the
// pair exactly wins.
bool parseLengthPrefixedPair(const std::string& pair, std::string* timestamp, std::string* text,
                             std::string* error);

// Type 5: hex(reversed RSA) "0001" -> the 40 upper-case hex characters of SHA-1(text).
bool openType5(const PrivateKey& enc, const std::string& payload, std::string* sha1Hex, std::string* error);
// Type 19: RSA hex of "011" "%02d"(L) text -> text.
bool openType19(const PrivateKey& enc, const std::string& payload, std::string* text, std::string* error);
// Type 38: 16 hex of the triple-DES F-padded digit block, then RSA hex of the DER key value
// (SEQUENCE { OCTET STRING key16, OCTET STRING 99*8 }) -> the PIN digits.
bool openType38(const PrivateKey& enc, const std::string& payload, std::string* pin, std::string* error);
// Type 68: the PIN key is the triple-DES (ECB, decrypt) of B under (A decrypted under the master
// key). All three as 32 hex characters; the result is 16 bytes.
bool derivePinKey68(const std::string& masterHex, const std::string& aHex, const std::string& bHex,
                    std::string* pinKey, std::string* error);
// Type 68: RSA hex of the triple-DES-encrypted ISO 9564 format 0 block (no PAN) -> PIN digits.
bool openType68(const PrivateKey& enc, const std::string& payload, const std::string& pinKey,
                std::string* pin, std::string* error);

// Opens a payload of kind `inner` (not Text/Hashed, not Type68 without a PIN key) with `key`:
// *content gets the text, PIN digits, salted-hash value or SHA-1 hex; *pairTimestamp the
// timestamp of a length-prefixed pair (else left empty).
bool openPayload(Inner inner, const std::string& value, const PrivateKey& key, const std::string& pinKey,
                 std::string* content, std::string* pairTimestamp, std::string* error);

// A payload left sealed (no encryption key given) must still look like what the type carries:
// an RSA value of at least 512 bits as hex or base64, with type 5's "0001" tail or type 38's
// 16-digit block in front. Otherwise it is another type's output: false with kRejected.
bool checkSealedShape(Inner inner, const std::string& payload, std::string* error);

}  // namespace tessel::server
