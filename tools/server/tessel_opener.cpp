// The envelope and the whole outputs by type (see tessel_opener.h).
#include "server/tessel_opener.h"

#include <openssl/crypto.h>

#include <algorithm>
#include <cstring>

#include "server/bytes.h"
#include "server/payloads.h"

namespace tessel::server {
namespace {

const unsigned char kSimpleBlobHeader[12] = {0x01, 0x02, 0x00, 0x00, 0x01, 0x68,
                                             0x00, 0x00, 0x00, 0xA4, 0x00, 0x00};

bool readDecimal8(const unsigned char* p, std::size_t* value) {
  std::size_t v = 0;
  for (int k = 0; k < 8; ++k) {
    if (p[k] < '0' || p[k] > '9') return false;
    v = v * 10 + (p[k] - '0');
  }
  *value = v;
  return true;
}

bool decodeLayout(const std::string& base64, std::string* raw, EnvelopeLayout* layout, std::string* error) {
  if (base64.size() > kMaxOutputBytes) return fail(error, "output longer than 65536 bytes");
  if (!fromBase64(base64, raw, "envelope", error)) return false;
  const auto* p = reinterpret_cast<const unsigned char*>(raw->data());
  if (raw->size() < 8 + 12) return fail(error, "envelope truncated: " + std::to_string(raw->size()) + " bytes");
  std::size_t blob = 0;
  if (!readDecimal8(p, &blob)) return fail(error, "envelope does not start with an 8-digit key length");
  if (blob < 12 + 1) return fail(error, "envelope key length field " + std::to_string(blob) + " is too small");
  if (std::memcmp(p + 8, kSimpleBlobHeader, sizeof kSimpleBlobHeader) != 0)
    return fail(error, "envelope key header is not an RC4 SIMPLEBLOB wrapped with RSA");
  if (raw->size() < 8 + blob + 8)
    return fail(error, "envelope truncated inside the wrapped key (" + std::to_string(raw->size()) + " bytes)");
  std::size_t length = 0;
  if (!readDecimal8(p + 8 + blob, &length)) return fail(error, "envelope content length field is not 8 digits");
  const std::size_t expected = 8 + blob + 8 + length;
  if (raw->size() < expected)
    return fail(error, "envelope truncated: " + std::to_string(raw->size()) + " of " + std::to_string(expected) + " bytes");
  if (raw->size() > expected)
    return fail(error, "envelope has " + std::to_string(raw->size() - expected) + " bytes after its content");
  layout->keyBlobLength = blob;
  layout->rsaLength = blob - 12;
  layout->contentLength = length;
  layout->totalLength = raw->size();
  return true;
}

bool validLetter(char c) { return c != '\0' && std::strchr("EWMSTR", c) != nullptr; }

}  // namespace

bool parseEnvelope(const std::string& base64, EnvelopeLayout* layout, std::string* error) {
  ClearsOpenSslErrors clear;
  std::string raw;
  Wiped w{raw};
  return decodeLayout(base64, &raw, layout, error);
}

bool openEnvelope(const std::string& base64, const PrivateKey& key, std::size_t drop, std::string* content,
                  std::string* error) {
  ClearsOpenSslErrors clear;
  std::string raw, wrappedKey, rc4Key;
  Wiped w1{raw}, w2{wrappedKey}, w3{rc4Key};
  EnvelopeLayout layout;
  if (!decodeLayout(base64, &raw, &layout, error)) return false;
  if (!key.loaded()) return fail(error, "no application-platform private key loaded");
  if (layout.rsaLength != key.size())
    return fail(error, "envelope key is wrapped for a " + std::to_string(layout.rsaLength * 8) +
                           "-bit key, the private key has " + std::to_string(key.size() * 8) + " bits (foreign envelope?)");
  wrappedKey.assign(raw, 20, layout.rsaLength);
  std::reverse(wrappedKey.begin(), wrappedKey.end());  // stored least significant byte first
  if (!key.decryptPkcs1(wrappedKey, 16, &rc4Key, error)) return false;
  const std::string sealed(raw, 8 + layout.keyBlobLength + 8, layout.contentLength);
  return cipherPass("RC4", true, rc4Key, drop, sealed, content, error);
}

bool splitWrapped(const std::string& content, Wrapped* out, std::string* error, bool atLastColon,
                  const std::string& expectedTimestamp) {
  // The fields are cut whether or not the content is valid, so a forged content costs the same
  // copies as a genuine one; only the returned answer differs.
  std::size_t colon = std::string::npos;
  if (!expectedTimestamp.empty()) {
    const std::size_t n = expectedTimestamp.size();
    if (content.size() >= n + 2 && CRYPTO_memcmp(content.data() + 1, expectedTimestamp.data(), n) == 0 &&
        content[n + 1] == ':')
      colon = n + 1;
  } else if (content.size() >= 2) {
    colon = atLastColon ? content.rfind(':') : content.find(':', 1);
  }
  const bool valid = colon != std::string::npos && colon != 0 && validLetter(content[0]);
  const std::size_t cut = valid ? colon : std::min<std::size_t>(content.size(), 1);
  out->strength = content.empty() ? 0 : content[0];
  // Room for the whole content in both fields: the allocations do not depend on where ':' is.
  wipeString(&out->payload);
  out->timestamp.reserve(content.size());
  out->payload.reserve(content.size());
  out->timestamp.assign(content, std::min<std::size_t>(content.size(), 1), cut > 0 ? cut - 1 : 0);
  out->payload.assign(content, std::min(content.size(), cut + 1), std::string::npos);
  return valid || fail(error, kRejected);
}

Opened::~Opened() { clear(); }

void Opened::clear() {
  wipeString(&payload);
  wipeString(&content);
  timestamp.clear();
  wrapped = contentOpened = false;
  strength = 0;
}

namespace {

// The payload (or a direct output) under `key`: content and a pair's timestamp.
bool openInner(Inner inner, const std::string& value, const PrivateKey& key, const OpenKeys& keys, Opened* out,
               std::string* error) {
  std::string pairTimestamp;
  if (!openPayload(inner, value, key, keys.pinKey, &out->content, &pairTimestamp, error)) return false;
  if (inner == Inner::PairPkcs1Hex || inner == Inner::PairPkcs1Base64) {
    const std::string& expected = out->wrapped ? out->timestamp : keys.expectedTimestamp;
    if ((out->wrapped || !expected.empty()) &&
        (pairTimestamp.size() != expected.size() ||
         CRYPTO_memcmp(pairTimestamp.data(), expected.data(), expected.size()) != 0))
      return fail(error, kRejected);
    out->timestamp = pairTimestamp;
  }
  out->contentOpened = true;
  return true;
}

bool openAny(int type, const std::string& output, const OpenKeys& keys, Opened* out, std::string* error) {
  if (output.size() > kMaxOutputBytes) return fail(error, "output longer than 65536 bytes");
  const TypeLayout t = typeLayout(type);
  switch (t.outer) {
    case Outer::Unknown:
      return fail(error, "encryption type " + std::to_string(type) + " produces no output");
    case Outer::DirectWithEnc:
    case Outer::DirectWithApp: {
      const bool enc = t.outer == Outer::DirectWithEnc;
      const PrivateKey* key = enc ? keys.enc : keys.app;
      if (key == nullptr)
        return fail(error, "type " + std::to_string(type) + " needs the " +
                               (enc ? "encryption" : "application") + "-platform key");
      return openInner(t.inner, output, *key, keys, out, error);
    }
    case Outer::BareEnvelope:
    case Outer::WrappedEnvelope:
      break;
  }
  if (keys.app == nullptr) return fail(error, "envelopes need the application-platform key");
  std::string content;
  Wiped w{content};
  if (!openEnvelope(output, *keys.app, t.drop, &content, error)) return false;
  if (t.outer == Outer::BareEnvelope) {
    out->content = content;
    out->contentOpened = true;
    return true;
  }
  // From here on every failure is the one answer.
  Wrapped parts;
  Wiped wp{parts.payload};
  const bool split =
      splitWrapped(content, &parts, error, payloadIsEncoded(t.inner, keys.saltedHash), keys.expectedTimestamp);
  out->wrapped = true;
  out->strength = parts.strength;
  out->timestamp.reserve(content.size());
  out->payload.reserve(content.size());
  out->timestamp = parts.timestamp;
  out->payload = parts.payload;
  if (t.inner == Inner::Text || t.inner == Inner::Hashed) {
    out->content.reserve(content.size());
    out->content = out->payload;
    out->contentOpened = true;
    return split;
  }
  if (!split) return false;
  if (keys.enc == nullptr || (t.inner == Inner::Type68 && keys.pinKey.empty()))
    return checkSealedShape(t.inner, out->payload, error);  // stays sealed
  if (!openInner(t.inner, out->payload, *keys.enc, keys, out, error)) return fail(error, kRejected);
  return true;
}

}  // namespace

bool openOutput(int type, const std::string& output, const OpenKeys& keys, Opened* out, std::string* error) {
  ClearsOpenSslErrors clear;
  out->clear();
  if (openAny(type, output, keys, out, error)) return true;
  out->clear();
  return false;
}

}  // namespace tessel::server
