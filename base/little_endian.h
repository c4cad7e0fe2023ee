// Bounded little-endian loads and stores: wire records are never cast to structs.
#ifndef KRAL_BASE_LITTLE_ENDIAN_H
#define KRAL_BASE_LITTLE_ENDIAN_H

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

namespace kral {

// The value at an offset, or nothing when the bytes do not hold it.
template <std::unsigned_integral T>
constexpr std::optional<T> LoadLe(std::span<const uint8_t> bytes, size_t offset = 0) {
  if (offset > bytes.size() || bytes.size() - offset < sizeof(T)) return std::nullopt;
  T value = 0;
  for (size_t i = 0; i < sizeof(T); ++i) {
    value = static_cast<T>(value | static_cast<T>(static_cast<T>(bytes[offset + i]) << (8 * i)));
  }
  return value;
}

// Stores the value at an offset; false (nothing stored) when there is no room.
template <std::unsigned_integral T>
constexpr bool StoreLe(std::span<uint8_t> bytes, size_t offset, T value) {
  if (offset > bytes.size() || bytes.size() - offset < sizeof(T)) return false;
  for (size_t i = 0; i < sizeof(T); ++i) bytes[offset + i] = static_cast<uint8_t>(value >> (8 * i));
  return true;
}

}  // namespace kral

#endif
