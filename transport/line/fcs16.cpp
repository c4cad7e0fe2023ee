// The frame check sequence, fast: long messages are folded by 8-byte words, what remains goes through tables.
//
// Read the message as a polynomial over bits, the first bit being the highest power; its check is what remains after
// division by G = x^16 + x^12 + x^5 + 1. Over bits, squaring doubles the exponents and adds nothing else:
//
//   G^64 = x^1024 + x^768 + x^320 + 1, so that x^1024 leaves the same remainder as x^768 + x^320 + 1.
//
// An 8-byte word counts as itself times x^64 for each word behind it, and 1024, 768 and 320 bits are 16, 12 and 5
// words. So a word may be removed if it is XORed into the words 16 - 12 = 4, 16 - 5 = 11 and 16 - 0 = 16 places later:
// neither a multiplication nor a table takes part. Words are handled in pairs, with vectors that any compiler target
// can do.
//
// Where a message begins does not matter: zeros in front of it change no remainder. A check value computed so far
// counts as if it were XORed into the next two bytes; so does the initial value.
#include "transport/line/fcs16.h"

#include <array>
#include <bit>
#include <cstddef>
#include <cstring>
#include <utility>

namespace kral {
namespace {

static_assert(std::endian::native == std::endian::little, "a check value XORed into a word meets its first two bytes");

constexpr uint16_t kPolynomial = 0x8408;  // 0x1021, bit-reversed: bits arrive least significant first
constexpr uint16_t kInitial = 0xFFFF;
constexpr size_t kSlice = 16;

constexpr uint16_t ShiftBit(uint16_t fcs, unsigned bit) {
  const unsigned out = (fcs ^ bit) & 1U;
  return static_cast<uint16_t>((fcs >> 1) ^ (out != 0 ? kPolynomial : 0));
}

constexpr uint16_t ShiftByte(uint16_t fcs, unsigned byte) {
  for (unsigned bit = 0; bit < 8; ++bit) fcs = ShiftBit(fcs, byte >> bit);
  return fcs;
}

// kTables[n][byte]: the check of a byte with n zero bytes behind it. Row 0 is the usual byte table.
constexpr auto kTables = [] {
  std::array<std::array<uint16_t, 256>, kSlice> tables{};
  for (unsigned byte = 0; byte < 256; ++byte) tables[0][byte] = ShiftByte(0, byte);
  for (size_t zeros = 1; zeros < kSlice; ++zeros) {
    for (unsigned byte = 0; byte < 256; ++byte) {
      const uint16_t fcs = tables[zeros - 1][byte];
      tables[zeros][byte] = static_cast<uint16_t>((fcs >> 8) ^ tables[0][fcs & 0xFFU]);
    }
  }
  return tables;
}();
static_assert(kTables[0][1] == 0x1189 && kTables[0][2] == 0x2312 && kTables[0][3] == 0x329B);

// kInitialBehind[n]: what n zero bytes make of the initial value.
constexpr auto kInitialBehind = [] {
  std::array<uint16_t, kSlice> values{kInitial};
  for (size_t n = 1; n < kSlice; ++n) values[n] = ShiftByte(values[n - 1], 0);
  return values;
}();

// The check of up to 15 bytes from the initial value: each byte on its own, and all of them XORed.
uint16_t StartWith(const uint8_t* data, size_t size) {
  uint16_t fcs = kInitialBehind[size];
  for (size_t i = 0; i < size; ++i) fcs ^= kTables[size - 1 - i][data[i]];
  return fcs;
}

template <size_t... I>
uint16_t AddSlice(uint16_t fcs, const uint8_t* data, std::index_sequence<I...>) {
  const unsigned first = kTables[kSlice - 1][data[0] ^ (fcs & 0xFFU)] ^ kTables[kSlice - 2][data[1] ^ (fcs >> 8)];
  return static_cast<uint16_t>((first ^ ... ^ kTables[kSlice - 3 - I][data[2 + I]]));
}

// `size` is a multiple of kSlice.
uint16_t AddSlices(uint16_t fcs, const uint8_t* data, size_t size) {
  for (; size != 0; size -= kSlice, data += kSlice) {
    fcs = AddSlice(fcs, data, std::make_index_sequence<kSlice - 2>());
  }
  return fcs;
}

using WordPair = uint64_t __attribute__((vector_size(16)));
constexpr size_t kPairs = 8;  // the 16 words that a word is folded into
constexpr size_t kWindow = kPairs * sizeof(WordPair);
using Window = std::array<WordPair, kPairs>;

WordPair Load(const uint8_t* data) {
  WordPair pair;
  std::memcpy(&pair, data, sizeof(pair));
  return pair;
}

// The two words around the border between two pairs: the second of one and the first of the next.
WordPair Straddle(WordPair pair, WordPair next) {
  return __builtin_shufflevector(pair, next, 1, 2);
}

// Each word takes up the words 4, 11 and 16 places before it. For pairs these are the pair 2 before; the words between
// the pairs 6 and 5 before; and the pair 8 before, the one whose place in the window the new pair takes.
template <size_t... I>
void FoldWindow(Window& w, const uint8_t* data, std::index_sequence<I...>) {
  ((w[I] ^= Load(data + I * sizeof(WordPair)) ^ w[(I + kPairs - 2) % kPairs] ^
            Straddle(w[(I + kPairs - 6) % kPairs], w[(I + kPairs - 5) % kPairs])),
   ...);
}

// The last 16 words are not removed, so what they took up from each other comes out again: the last pair first, so that
// those before it are still as they were taken up.
void UndoWithin(Window& w) {
  constexpr WordPair kNone = {0, 0};
  for (size_t i = kPairs - 1; i >= 2; --i) {
    w[i] ^= w[i - 2] ^ Straddle(i >= 6 ? w[i - 6] : kNone, i >= 5 ? w[i - 5] : kNone);
  }
}

// `size` is a multiple of kWindow.
uint16_t AddWindows(uint16_t fcs, const uint8_t* data, size_t size) {
  Window w = {WordPair{fcs, 0}};
  for (; size != 0; size -= kWindow, data += kWindow) FoldWindow(w, data, std::make_index_sequence<kPairs>());
  UndoWithin(w);
  std::array<uint8_t, kWindow> rest;
  std::memcpy(rest.data(), w.data(), kWindow);
  return AddSlices(0, rest.data(), kWindow);
}

}  // namespace

uint16_t ComputeFcs16(const uint8_t* data, uint16_t bit_count) {
  size_t size = bit_count / 8U;
  const uint8_t* const end = data + size;

  const size_t head = size % kSlice;
  uint16_t fcs = StartWith(data, head);
  data += head;
  size -= head;

  if (size >= 2 * kWindow) {  // under that, the folding would not pay for its end
    const size_t windows = size - size % kWindow;
    fcs = AddWindows(fcs, data, windows);
    data += windows;
    size -= windows;
  }
  fcs = AddSlices(fcs, data, size);

  for (unsigned bit = 0; bit < bit_count % 8U; ++bit) fcs = ShiftBit(fcs, static_cast<unsigned>(*end) >> bit);
  return static_cast<uint16_t>(fcs ^ 0xFFFF);
}

}  // namespace kral
