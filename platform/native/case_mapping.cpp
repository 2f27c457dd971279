// The letters that have one partner in the other case: Latin, Greek, Cyrillic, Armenian, circled
// and full-width ones.
#include <array>

#include "platform/text.h"

namespace platform {
namespace {

// Upper-case letters whose lower-case partner stands `offset` further on. Step 1: every letter of
// the range; step 2: every other one, from the first (the letters between are the partners).
struct CaseRange {
  char16_t first;
  char16_t last;
  std::int16_t offset;
  std::uint8_t step;
};

// Ordered by upper-case letter. Left out because the system maps them to themselves: the signs
// U+00D7 and U+00F7, and the letters without a single partner (U+00DF, U+0130, U+0131, U+0138,
// U+0149, U+017F).
constexpr std::array kCaseRanges = {
    CaseRange{0x0041, 0x005A, 32, 1}, CaseRange{0x00C0, 0x00D6, 32, 1},
    CaseRange{0x00D8, 0x00DE, 32, 1}, CaseRange{0x0100, 0x012E, 1, 2},
    CaseRange{0x0132, 0x0136, 1, 2},  CaseRange{0x0139, 0x0147, 1, 2},
    CaseRange{0x014A, 0x0176, 1, 2},  CaseRange{0x0178, 0x0178, -121, 1},
    CaseRange{0x0179, 0x017D, 1, 2},  CaseRange{0x0386, 0x0386, 38, 1},
    CaseRange{0x0388, 0x038A, 37, 1}, CaseRange{0x038C, 0x038C, 64, 1},
    CaseRange{0x038E, 0x038F, 63, 1}, CaseRange{0x0391, 0x03A1, 32, 1},
    CaseRange{0x03A3, 0x03AB, 32, 1}, CaseRange{0x03E2, 0x03EE, 1, 2},
    CaseRange{0x0400, 0x040F, 80, 1}, CaseRange{0x0410, 0x042F, 32, 1},
    CaseRange{0x0460, 0x0480, 1, 2},  CaseRange{0x048A, 0x04BE, 1, 2},
    CaseRange{0x04C0, 0x04C0, 15, 1}, CaseRange{0x04C1, 0x04CD, 1, 2},
    CaseRange{0x04D0, 0x0526, 1, 2},  CaseRange{0x0531, 0x0556, 48, 1},
    CaseRange{0x1E00, 0x1E94, 1, 2},  CaseRange{0x1EA0, 0x1EFE, 1, 2},
    CaseRange{0x2160, 0x216F, 16, 1}, CaseRange{0x24B6, 0x24CF, 26, 1},
    CaseRange{0xFF21, 0xFF3A, 32, 1},
};

// Raised like its ordinary twin, whereas lowering never leads to it.
constexpr char16_t kFinalSigma = 0x03C2;
constexpr char16_t kCapitalSigma = 0x03A3;

}  // namespace

char16_t ToLower(char16_t unit) noexcept {
  if (unit < 0x80) return unit >= u'A' && unit <= u'Z' ? static_cast<char16_t>(unit + 32) : unit;
  for (const CaseRange& range : kCaseRanges) {
    if (unit < range.first) break;
    if (unit <= range.last && (unit - range.first) % range.step == 0) {
      return static_cast<char16_t>(unit + range.offset);
    }
  }
  return unit;
}

char16_t ToUpper(char16_t unit) noexcept {
  if (unit < 0x80) return unit >= u'a' && unit <= u'z' ? static_cast<char16_t>(unit - 32) : unit;
  if (unit == kFinalSigma) return kCapitalSigma;
  for (const CaseRange& range : kCaseRanges) {
    const int upper = unit - range.offset;
    if (upper >= range.first && upper <= range.last && (upper - range.first) % range.step == 0) {
      return static_cast<char16_t>(upper);
    }
  }
  return unit;
}

}  // namespace platform
