// The encryption dispatcher. One table row per encryption type says which moduli the type needs,
// what it wraps and how; encryptionDispatch makes the checks in their fixed order (timestamp,
// text, result, type, moduli) and then builds the output. The first failure ends the call and
// its code is passed up unchanged.
#include "output/dispatcher.h"

#include <cstdint>
#include <cstring>
#include <utility>

#include "output/dispatch_payloads.h"
#include "output/envelope.h"
#include "pattern/strength.h"

namespace tessel {
namespace {

enum class Keys : std::uint8_t { None, App, Enc, Both };

enum class Form : std::uint8_t {
  Unknown,             // error 8
  // Inside an envelope under the application modulus, after the strength letter and timestamp:
  Text,                // the text itself
  KeyouHex,            // keyouRsaHex(enc, text)
  KeyouBase64,         // keyouRsaBase64(enc, text)
  Pkcs1Hex,            // pkcs1RsaHex(enc, text)
  PairPkcs1Hex,        // pkcs1RsaHex(enc, pair in the fixed buffer)
  PairPkcs1Base64,     // pkcs1RsaBase64(enc, pair in the fixed buffer)
  Type5, Type19, Type38, Type68,
  Hashed,              // salted hash value
  HashedRsa,           // pkcs1RsaHex(enc, salted hash value)
  // An envelope of the bare text, no letter or timestamp:
  Bare,
  // Returned as they are:
  DirectKeyouBase64,       // keyouRsaBase64(enc, text)
  DirectPairPkcs1Base64,   // pkcs1RsaBase64(enc, pair in the fixed buffer)
  DirectPairPkcs1Hex,      // pkcs1RsaHex(enc, pair on the heap)
  DirectKeyouHex,          // keyouRsaHex(enc, text)
  DirectPkcs1Hex,          // pkcs1RsaHex(enc, text)
  DirectAppPkcs1Hex,       // pkcs1RsaHex(app, text)
  DirectAppPkcs1Base64,    // pkcs1RsaBase64(app, text)
};

struct TypeRule {
  Keys keys;
  Form form;
  std::uint16_t drop;
  bool timestampOptional;
};

constexpr TypeRule kUnknownType{Keys::None, Form::Unknown, 0, true};

// Types 0..90. Whatever a case does not name is the plain-text envelope under the application
// modulus: 0, 6, 7, 9, 11, 13-18, 23-26, 31, 32, 34, 35, 37, 39, 41, 43-45, 49, 52-54, 57, 58,
// 60-64, 66, 67, 70-72, 75, 80, 84, 85, 87, 89, 90.
TypeRule ruleFor(int type) noexcept {
  const auto wrapped = [](Keys keys, Form form, std::uint16_t drop = kEnvelopeDrop) {
    return TypeRule{keys, form, drop, false};
  };
  switch (type) {
    case 1: return wrapped(Keys::App, Form::Text, kEnvelopeDropLegacy);
    case 2: case 20: case 27: case 81: return wrapped(Keys::Both, Form::KeyouHex);
    case 33: return wrapped(Keys::Both, Form::KeyouHex, kEnvelopeDropLegacy);
    case 12: case 42: return wrapped(Keys::Both, Form::KeyouBase64);
    case 10: case 28: case 36: case 40: case 50: case 74: case 82: case 86:
      return wrapped(Keys::Both, Form::Pkcs1Hex);
    case 8: case 51: return wrapped(Keys::Both, Form::PairPkcs1Hex);
    case 46: return wrapped(Keys::Both, Form::PairPkcs1Base64);
    case 5: return wrapped(Keys::Both, Form::Type5);
    case 19: return wrapped(Keys::Both, Form::Type19);
    case 38: return wrapped(Keys::Both, Form::Type38);
    case 68: return wrapped(Keys::Both, Form::Type68);
    case 47: case 55: return wrapped(Keys::Both, Form::HashedRsa);
    case 48: case 59: return wrapped(Keys::App, Form::Hashed);
    case 88: return TypeRule{Keys::App, Form::Bare, kEnvelopeDropBare, true};
    case 3: return TypeRule{Keys::Enc, Form::DirectKeyouBase64, 0, true};
    case 4: return TypeRule{Keys::Enc, Form::DirectPairPkcs1Base64, 0, false};
    case 22: return TypeRule{Keys::Enc, Form::DirectPairPkcs1Hex, 0, false};
    case 29: return TypeRule{Keys::Enc, Form::DirectKeyouHex, 0, true};
    case 30: return TypeRule{Keys::Enc, Form::DirectPkcs1Hex, 0, true};
    case 56: return TypeRule{Keys::App, Form::DirectAppPkcs1Hex, 0, true};
    case 73: return TypeRule{Keys::App, Form::DirectAppPkcs1Base64, 0, true};
    case 21: case 65: case 69: case 76: case 77: case 78: case 79: case 83:
      return kUnknownType;
    default:
      return wrapped(Keys::App, Form::Text);
  }
}

// An empty modulus text is as good as none: treat it as missing so the caller learns which key
// to set instead of getting a padding failure.
const char* presentKey(const char* const keyPair[2], int slot) noexcept {
  if (keyPair == nullptr || keyPair[slot] == nullptr || keyPair[slot][0] == '\0') return nullptr;
  return keyPair[slot];
}

ErrorCode checkKeys(Keys keys, const char* app, const char* enc) noexcept {
  switch (keys) {
    case Keys::None:
      return kOk;
    case Keys::App:
      return app == nullptr ? kErrAppModulusMissing : kOk;
    case Keys::Enc:
      return enc == nullptr ? kErrEncModulusMissing : kOk;
    case Keys::Both:
      if (app == nullptr) return enc == nullptr ? kErrBothModuliMissing : kErrAppModulusMissing;
      return enc == nullptr ? kErrEncModulusMissing : kOk;
  }
  return kOk;
}

const std::uint8_t* bytesOf(const char* text) noexcept { return reinterpret_cast<const std::uint8_t*>(text); }

// Outputs that are not wrapped in an envelope with a strength letter.
ErrorCode buildDirect(Form form, const char* app, const char* enc, const char* text, const char* timestamp,
                      SecureBuffer* out) noexcept {
  const std::size_t n = std::strlen(text);
  SecureBuffer pair;
  ErrorCode code = kOk;
  switch (form) {
    case Form::Bare:
      return digitalEnvelope(kEnvelopeDropBare, app, bytesOf(text), n, out);
    case Form::DirectKeyouBase64:
      return keyouRsaBase64(enc, bytesOf(text), n, out);
    case Form::DirectKeyouHex:
      return keyouRsaHex(enc, bytesOf(text), n, out);
    case Form::DirectPkcs1Hex:
      return pkcs1RsaHex(enc, bytesOf(text), n, out);
    case Form::DirectAppPkcs1Hex:
      return pkcs1RsaHex(app, bytesOf(text), n, out);
    case Form::DirectAppPkcs1Base64:
      return pkcs1RsaBase64(app, bytesOf(text), n, out);
    case Form::DirectPairPkcs1Base64:
      code = lengthPrefixedPair(timestamp, text, true, &pair);
      return code != kOk ? code : pkcs1RsaBase64(enc, pair.data(), pair.size(), out);
    case Form::DirectPairPkcs1Hex:
      code = lengthPrefixedPair(timestamp, text, false, &pair);
      return code != kOk ? code : pkcs1RsaHex(enc, pair.data(), pair.size(), out);
    default:
      return kErrUnknownType;
  }
}

// The inner payload of an envelope type; *rated is set when the strength letter is computed
// over part of the text rather than all of it.
ErrorCode buildPayload(int type, Form form, const char* enc, const char* text, const char* timestamp,
                       SecureBuffer* payload, SecureBuffer* rated) noexcept {
  const std::size_t n = std::strlen(text);
  SecureBuffer pair;
  ErrorCode code = kOk;
  switch (form) {
    case Form::Text: {
      SecureBuffer copy = SecureBuffer::copyOf(text, n);
      if (!copy) return kErrAllocation;
      *payload = std::move(copy);
      return kOk;
    }
    case Form::KeyouHex:
      return keyouRsaHex(enc, bytesOf(text), n, payload);
    case Form::KeyouBase64:
      return keyouRsaBase64(enc, bytesOf(text), n, payload);
    case Form::Pkcs1Hex:
      return pkcs1RsaHex(enc, bytesOf(text), n, payload);
    case Form::PairPkcs1Hex:
      code = lengthPrefixedPair(timestamp, text, true, &pair);
      return code != kOk ? code : pkcs1RsaHex(enc, pair.data(), pair.size(), payload);
    case Form::PairPkcs1Base64:
      code = lengthPrefixedPair(timestamp, text, true, &pair);
      return code != kOk ? code : pkcs1RsaBase64(enc, pair.data(), pair.size(), payload);
    case Form::Type5:
      return type5Payload(enc, text, payload);
    case Form::Type19:
      return type19Payload(enc, text, payload);
    case Form::Type38:
      return type38Payload(enc, text, payload);
    case Form::Type68:
      return type68Payload(enc, text, payload, rated);
    case Form::Hashed:
    case Form::HashedRsa:
      return hashedPayload(type, enc, text, payload, rated);
    default:
      return kErrUnknownType;
  }
}

}  // namespace

ErrorCode encryptionDispatch(int type, const char* const keyPair[2], SecureBuffer* result,
                             const char* text, const char* timestamp) noexcept {
  // Negative types count as "above 90", as the strength rating reads them (unsigned).
  const bool known = type >= 0 && type <= 90;
  const TypeRule rule = known ? ruleFor(type) : kUnknownType;
  if (result != nullptr) result->reset();
  if (!rule.timestampOptional && timestamp == nullptr) return kErrTimestampMissing;
  if (text == nullptr) return kErrTextMissing;
  if (result == nullptr) return kErrResultMissing;
  if (!known) return kErrUnknownType;
  const char* app = presentKey(keyPair, 0);
  const char* enc = presentKey(keyPair, 1);
  ErrorCode code = checkKeys(rule.keys, app, enc);
  if (code != kOk) return code;
  if (rule.form == Form::Unknown) return kErrUnknownType;

  SecureBuffer out;
  if (rule.form >= Form::Bare) {
    code = buildDirect(rule.form, app, enc, text, timestamp, &out);
  } else {
    SecureBuffer payload, rated, wrapped;
    code = buildPayload(type, rule.form, enc, text, timestamp, &payload, &rated);
    if (code == kOk) {
      const char letter = rateStrength(static_cast<std::uint32_t>(type), rated ? rated.c_str() : text);
      code = payloadWrapper(letter, timestamp, payload.c_str(), &wrapped);
    }
    if (code == kOk) code = digitalEnvelope(rule.drop, app, wrapped.data(), wrapped.size(), &out);
  }
  if (code == kOk) *result = std::move(out);
  return code;
}

}  // namespace tessel
