// Editing and judging the sealed text (session/sealed_text.h): every call opens the seal with a
// ContentGuard and reseals on the way out, so the text is plain only for one edit or one check.
#include "session/sealed_text.h"

#include <cstddef>

#include "pattern/pattern_engine.h"
#include "session/session.h"

namespace tessel {

void appendCharacter(ContentStore& store, std::uint8_t ch, const PatternEngine& accepts) noexcept {
  if (store.length >= kContentCapacity) return;
  ContentGuard guard(store);
  std::uint8_t* text = guard.text();
  const std::size_t n = store.length;
  text[n] = ch;
  text[n + 1] = 0;
  MatchContext context;
  if (accepts.matches(text, n + 1, &context)) {
    store.length = static_cast<std::uint16_t>(n + 1);
  } else {
    text[n] = 0;
  }
}

void deleteLastCharacter(ContentStore& store) noexcept {
  if (store.length == 0) return;
  ContentGuard guard(store);
  const std::size_t n = store.length;
  guard.text()[n - 1] = 0;
  store.length = static_cast<std::uint16_t>(n - 1);
}

char sessionDegree(KeyboardSession& session) {
  ContentGuard guard(*session.content);
  guard.text()[guard.length()] = 0;  // already the terminator; stated, not assumed
  return rateStrength(48, reinterpret_cast<const char*>(guard.text()));
}

int sessionVerify(KeyboardSession& session) {
  PasswordRule rule;
  if (!buildPasswordRule(session, &rule)) return kVerifyTrivial;
  int code;
  {
    ContentGuard guard(*session.content);
    guard.text()[guard.length()] = 0;
    code = verifyPassword(48, reinterpret_cast<const char*>(guard.text()), true, rule);
  }
  releasePasswordRule(rule);
  return code;
}

bool buildPasswordRule(const KeyboardSession& session, PasswordRule* rule) noexcept {
  *rule = PasswordRule{};
  if (!parseDictionary(session.content->dictionaryFilter, &rule->dictionary)) return false;
  rule->minLength = static_cast<std::uint32_t>(static_cast<std::int32_t>(session.minLength));
  rule->accepts = session.acceptsEngine;
  rule->requiredClasses = session.content->contentType;
  return true;
}

}  // namespace tessel
