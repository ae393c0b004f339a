// wholeMatch: compile-and-match in one call, for the key-press accepts check.
//
// The engine and its match context both live on this frame and are freed on return.
#include "pattern/match.h"

#include "pattern/pattern_engine.h"

namespace tessel {

bool wholeMatch(const char* pattern, const std::uint8_t* text, std::size_t length) {
  const PatternEngine engine(pattern);
  if (!engine.hasTree()) return false;
  MatchContext context;
  return engine.matches(text, length, &context);
}

}  // namespace tessel
