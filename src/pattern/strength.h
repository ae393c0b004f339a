// Strength degree and password rule verification.
#pragma once

#include <cstdint>

namespace tessel {

struct KeyboardSession;

// Degree letter 'E', 'W', 'M', 'S', 'T' or 'R' of text under a rule set (0..90; above: default).
char rateStrength(std::uint32_t ruleSet, const char* text);

// Session operations behind getNativeDegree (rule set 48) and getNativeVerify (48, full check):
// both unseal and reseal the content themselves.
char sessionDegree(KeyboardSession& session);
int sessionVerify(KeyboardSession& session);

}  // namespace tessel
