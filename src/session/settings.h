// Setters that configure a session. Invalid values are dropped silently; none touches the
// typed text. The JNI layer converts managed arguments and calls these one to one.
//
// Every stored string is a private malloc'd copy; replacing one wipes and frees the old copy.
// Rules worth knowing at the call site:
//   setMaxLength     negative ignored; values above the 4092-character capacity are stored as
//                    4092, so key entry (which checks only maxLength) can never pass the buffer.
//   setKbdStyle      kbdPage = style / 2, shiftOn = style % 2 with C semantics (style -1 gives
//                    page 0 and shiftOn 0xFFFFFFFF, i.e. shifted).
//   setSwitchMode,
//   setFinishMode    the value as unsigned 16-bit if below 2, else 0.
//   setMode          only 0, 1 and 4 are stored.
//   setChallengeCode only a non-empty text replaces; setAlgorithmCode likewise.
//   setKbdFactor     "0..." kind 0, "1..." kind 1 (an earlier buffer stays), anything else
//                    kind 2 with the text after its first character; null or empty ignored.
//   setHashRandom    "1:salt" / "2:salt" -> "::::::::::salt::::::::::S" / "...F"; others ignored.
//   setXxxPlat       isDer false: the hex modulus as given; true: the modulus read from DER hex,
//                    or null when the DER is refused (the old key is dropped either way).
//   setXxxPlatBlob   blob hex (white space skipped) minus its 20-byte header, bytes reversed,
//                    then the DER path.
//   setEccKey        "x,y", sized from both lengths; 0 when x or y is null or memory runs out.
#pragma once

#include <cstdint>

namespace tessel {

struct KeyboardSession;

void setAccepts(KeyboardSession& s, const char* pattern) noexcept;
void setMinLength(KeyboardSession& s, std::int16_t n) noexcept;
void setMaxLength(KeyboardSession& s, std::int16_t n) noexcept;
void setKbdRandom(KeyboardSession& s, bool on) noexcept;
void setKbdType(KeyboardSession& s, std::int16_t type) noexcept;
void setKbdStyle(KeyboardSession& s, std::int16_t style) noexcept;
void setKbdMode(KeyboardSession& s, std::int16_t mode) noexcept;
void setPopMode(KeyboardSession& s, bool on) noexcept;
void setSwitchMode(KeyboardSession& s, std::int16_t mode) noexcept;
void setFinishMode(KeyboardSession& s, std::int16_t mode) noexcept;
void setMode(KeyboardSession& s, std::int16_t mode) noexcept;
void setEncryptType(KeyboardSession& s, std::int8_t type) noexcept;
void setContentType(KeyboardSession& s, std::int32_t type) noexcept;
void setChallengeCode(KeyboardSession& s, const char* code) noexcept;  // NUL-terminated bytes
void setKbdFactor(KeyboardSession& s, const char* text) noexcept;
void setAlgorithmCode(KeyboardSession& s, const char* text) noexcept;
void setHashRandom(KeyboardSession& s, const char* text) noexcept;
void setDictionaryFilter(KeyboardSession& s, const char* text) noexcept;
void setAppPlat(KeyboardSession& s, const char* key, bool isDer) noexcept;
void setEncryPlat(KeyboardSession& s, const char* key, bool isDer) noexcept;
// Key blob (hex, white space allowed): 0 when the hex cannot be decoded, else 1 (even when the
// converted key is then refused and the field cleared).
int setAppPlatBlob(KeyboardSession& s, const char* blobHex) noexcept;
int setEncryPlatBlob(KeyboardSession& s, const char* blobHex) noexcept;
int setEccKey(KeyboardSession& s, const char* x, const char* y) noexcept;

}  // namespace tessel
