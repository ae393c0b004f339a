// The operations that edit or judge the sealed text: append, delete, the degree and the rule
// verdict. (Clearing is in session.h, the outputs and the measure value in session/output.h.)
//
// Each unseals the text with a ContentGuard for the length of one call, hands a view of it to
// the pattern layer, and reseals it before returning; nothing else opens the seal.
#pragma once

#include <cstdint>

#include "pattern/strength.h"

namespace tessel {

struct ContentStore;
struct KeyboardSession;
class PatternEngine;

// Appends ch if the whole new text matches the compiled `accepts` (a malformed pattern matches
// nothing, so nothing is appended). A rejected character leaves the sealed bytes unchanged.
// The write position is `length` (the text holds no NUL that keys can produce, so this is its
// string length); nothing is written once the 4092-character capacity is reached. The caller
// applies maxLength.
void appendCharacter(ContentStore& store, std::uint8_t ch, const PatternEngine& accepts) noexcept;

// Removes the last character; nothing on empty content.
void deleteLastCharacter(ContentStore& store) noexcept;

// getNativeDegree: the text's letter under rule set 48.
char sessionDegree(KeyboardSession& session);

// getNativeVerify: the full check of rule set 48 under the session's rule (kVerify* codes of
// pattern/strength.h; kVerifyTrivial when the rule's dictionary cannot be allocated).
int sessionVerify(KeyboardSession& session);

// The rule of a session: minLength, the compiled accepts pattern, the store's contentType and
// dictionary list. False (nothing to release) when the dictionary cannot be allocated. Release
// with releasePasswordRule.
bool buildPasswordRule(const KeyboardSession& session, PasswordRule* rule) noexcept;

}  // namespace tessel
