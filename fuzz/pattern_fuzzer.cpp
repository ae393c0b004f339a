// Fuzzes the pattern engine (compile, whole-text match) and the strength rating.
//
// Input: byte 0 compile flags (bit 0 extended, bit 1 right-to-left), byte 1 the rule set of
// rateStrength (values above 90 pick the default rating), byte 2 the pattern length (at most
// 128), then the pattern bytes, then the text (at most 512 bytes). Without back-references a
// match costs at most program size x text length; with them the engine's step limit bounds it.
//
// Checks: a match result has the documented shape (1, N = group count, N + 1 ordered spans
// inside the text, group 0 the whole text, -1 -1 for groups that took no part); matches()
// agrees with matchExact(); the memo from the first step gives the spans of plain backtracking
// (where that finishes within its step limit); only a pattern with back-references may give
// up, and giving up reports no match; rateStrength returns one of the six letters.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

#include "fuzz_support.h"
#include "pattern/pattern_engine.h"
#include "pattern/strength.h"

namespace {

constexpr std::size_t kMaxPattern = 128;
constexpr std::size_t kMaxText = 512;

void checkResult(const tessel::MatchResult& r, const tessel::PatternEngine& engine, std::size_t length) {
  if (r.empty()) return;
  const auto n = static_cast<std::int32_t>(length);
  FUZZ_CHECK(r[0] == 1);
  FUZZ_CHECK(r[1] == engine.groupCount());
  FUZZ_CHECK(r.size() == 2 + 2 * static_cast<std::size_t>(r[1] + 1));
  FUZZ_CHECK(r[2] == 0 && r[3] == n);
  for (std::size_t k = 4; k < r.size(); k += 2) {
    const std::int32_t start = r[k], end = r[k + 1];
    if (start == -1 && end == -1) continue;
    FUZZ_CHECK(0 <= start && start <= end && end <= n);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size < 3) return 0;
  const std::uint32_t flags = ((data[0] & 1) ? tessel::PatternEngine::kExtended : 0) |
                              ((data[0] & 2) ? tessel::PatternEngine::kRightToLeft : 0);
  const std::uint32_t ruleSet = data[1];
  const std::size_t patternLength = data[2] < size - 3 ? data[2] : size - 3;
  if (patternLength > kMaxPattern) return 0;
  const std::string pattern(reinterpret_cast<const char*>(data + 3), patternLength);
  const std::size_t textOffset = 3 + patternLength;
  const std::size_t textLength = size - textOffset;
  if (textLength > kMaxText) return 0;
  const std::string text(reinterpret_cast<const char*>(data + textOffset), textLength);
  const auto* bytes = reinterpret_cast<const std::uint8_t*>(text.data());

  const tessel::PatternEngine engine(pattern.data(), pattern.size(), flags);

  tessel::MatchContext context;
  const tessel::MatchResult result = engine.matchExact(bytes, textLength, &context);
  FUZZ_CHECK(!context.gaveUp() || engine.hasBackrefs());
  if (engine.status() != tessel::PatternEngine::Status::kCompiled || context.gaveUp()) FUZZ_CHECK(result.empty());
  checkResult(result, engine, textLength);

  tessel::MatchContext second;
  FUZZ_CHECK(engine.matches(bytes, textLength, &second) == !result.empty());

  tessel::MatchContext plain, always;
  plain.setMemo(tessel::MatchContext::Memo::kNever);
  always.setMemo(tessel::MatchContext::Memo::kAlways);
  const tessel::MatchResult reference = engine.matchExact(bytes, textLength, &plain);
  if (!plain.gaveUp()) FUZZ_CHECK(engine.matchExact(bytes, textLength, &always) == reference);

  FUZZ_CHECK(tessel_fuzz::isStrengthLetter(tessel::rateStrength(ruleSet, text.c_str())));
  return 0;
}
