// Setters that configure a session. Invalid values are dropped silently; none touches the
// typed text. The JNI layer converts managed arguments and calls these one to one.
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
