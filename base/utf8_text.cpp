// Walks a text character by character, as RFC 3629 has them.
#include "base/utf8_text.h"

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace kral {
namespace {

constexpr uint8_t kDelete = 0x7F;

// How many bytes a character has that begins so; 0 for a byte that begins none.
size_t LengthOf(uint8_t lead) {
  if (lead < 0x80) return 1;
  if (lead >= 0xC2 && lead < 0xE0) return 2;
  if (lead >= 0xE0 && lead < 0xF0) return 3;
  if (lead >= 0xF0 && lead < 0xF5) return 4;
  return 0;
}

bool IsContinuation(uint8_t byte) {
  return (byte & 0xC0) == 0x80;
}

// The second byte rules out overlong forms, surrogates, what is beyond U+10FFFF, and C1 controls.
bool IsSecondOf(uint8_t lead, uint8_t second) {
  if (!IsContinuation(second)) return false;
  switch (lead) {
    case 0xC2:
    case 0xE0:
      return second >= 0xA0;
    case 0xED:
      return second < 0xA0;
    case 0xF0:
      return second >= 0x90;
    case 0xF4:
      return second < 0x90;
    default:
      return true;
  }
}

}  // namespace

void MakePrintableUtf8(char* text) {
  auto* const bytes = reinterpret_cast<uint8_t*>(text);
  const size_t size = std::strlen(text);
  for (size_t at = 0; at < size;) {
    const size_t length = LengthOf(bytes[at]);
    if (length == 1) {
      if (bytes[at] < ' ' || bytes[at] == kDelete) bytes[at] = '?';
      ++at;
      continue;
    }
    size_t held = 1;
    while (held < length && at + held < size &&
           (held == 1 ? IsSecondOf(bytes[at], bytes[at + 1]) : IsContinuation(bytes[at + held]))) {
      ++held;
    }
    if (length != 0 && held == length) {
      at += length;
    } else if (length != 0 && at + held == size) {
      bytes[at] = 0;  // cut off
      return;
    } else {
      bytes[at++] = '?';
    }
  }
}

}  // namespace kral
