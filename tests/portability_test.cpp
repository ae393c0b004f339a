// Plain char is signed on x86-64 and unsigned on ARM64 (most Android devices). Text reaches the
// library as char (JNI's modified UTF-8 carries bytes 0x80..0xFF), so every reader that indexes
// a table or compares ranges with a char must convert to unsigned first. Each row feeds a byte
// of 0x80..0xFF and checks it behaves exactly as a plain-ASCII byte outside the reader's
// alphabet does: the same on both kinds of target, with no out-of-range table read (which the
// sanitizer build reports on x86-64).
#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "crypto/bignum.h"
#include "crypto/codec.h"
#include "crypto/der.h"
#include "pattern/pattern_engine.h"
#include "pattern/strength.h"

using namespace tessel;

namespace {

std::string sameAs(const SecureBuffer& b) {
  return b ? std::string(b.c_str(), b.size()) : std::string("<absent>");
}

bool matches(const std::string& pattern, const std::string& text) {
  return PatternEngine(pattern.c_str()).matches(reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
}

// Each reader, run on text built around one byte `c`; a high byte must give what `reference`
// (an ASCII byte outside the reader's alphabet) gives.
struct Reader {
  const char* name;
  char reference;
  std::string (*run)(char c);
};

const Reader kReaders[] = {
    {"isHexText", 'G', [](char c) { return std::to_string(isHexText((std::string("A") + c + "1").c_str())); }},
    {"hexDecode", 'G', [](char c) { return sameAs(hexDecode((std::string(1, c) + "1").c_str())); }},
    {"hexDecodeSkippingSpace", 'G',
     [](char c) { return sameAs(hexDecodeSkippingSpace((std::string("1 ") + c).c_str())); }},
    {"base64Decode", '!', [](char c) {
       const std::string t = std::string("AAA") + c;
       return sameAs(base64Decode(t.c_str(), t.size()));
     }},
    {"bnRead radix 16", 'G', [](char c) {
       BigNumber n;
       return std::to_string(bnRead((std::string("1") + c).c_str(), 16, n));
     }},
    {"bnRead radix 10", 'G', [](char c) {
       BigNumber n;
       return std::to_string(bnRead((std::string("1") + c).c_str(), 10, n));
     }},
    {"derPublicKeyToModulusHex", 'G',
     [](char c) { return sameAs(derPublicKeyToModulusHex((std::string("30") + c + "0").c_str())); }},
    // Bytes of 0x80 and above belong to no named class, like a control byte.
    {"class [:print:]", '\x01', [](char c) { return std::to_string(matches("[:print:]+", std::string(2, c))); }},
    {"class [:alnum:]", '\x01', [](char c) { return std::to_string(matches("[:alnum:]+", std::string(2, c))); }},
    {"rateGeneral", '\x01', [](char c) { return std::string(1, rateGeneral((std::string("ab12") + c).c_str())); }},
    {"rateDefault", '\x01', [](char c) { return std::string(1, rateDefault((std::string("ab12") + c).c_str())); }},
};

}  // namespace

TEST(HighBytes, ReadersTreatThemAsOutsideTheirAlphabet) {
  for (const Reader& r : kReaders) {
    const std::string expected = r.run(r.reference);
    for (int b = 0x80; b <= 0xFF; ++b)
      EXPECT_EQ(r.run(static_cast<char>(b)), expected) << r.name << " byte 0x" << std::hex << b;
  }
}

// Pattern bytes are unsigned too: a literal high byte in a range is above every ASCII byte, so
// "[a-\xFF]" is a valid range (a signed reading would make it run backwards, i.e. malformed).
TEST(HighBytes, PatternLiteralsAndRangesAreUnsigned) {
  const struct {
    const char* pattern;
    const char* text;
    bool expected;
  } rows[] = {
      {"\xE9+", "\xE9\xE9", true},
      {"\xE9", "\xE8", false},
      {"[a-\xFF]+", "z\x80\xFF", true},
      {"[a-\xFF]+", "A", false},
      {"[\x80-\xFF]+", "\x80\xC3\xA9\xFF", true},
      {"[\x80-\xFF]", "\x7F", false},
      {"[^\x80-\xFF]+", "az\x7F", true},
      {"\\x80\\xff", "\x80\xFF", true},
      {"\\x{7f}", "\x7F", true},
      {".", "\xFF", true},
      {"[^a]", "\xFF", true},
  };
  for (const auto& row : rows)
    EXPECT_EQ(matches(row.pattern, row.text), row.expected) << row.pattern << " / " << row.text;
}
