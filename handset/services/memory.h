// The handset's address space: sparse, with every unwritten byte erased.
#ifndef KRAL_HANDSET_SERVICES_MEMORY_H
#define KRAL_HANDSET_SERVICES_MEMORY_H

#include <array>
#include <mutex>
#include <unordered_map>

#include "handset/line/request_table.h"

namespace kral::handset {

// Peek (2, 3, 4) and poke (5, 6, 7) of bytes, words and double words.
class Memory final : public Service {
 public:
  static constexpr uint8_t kErased = 0xFF;

  void Register(RequestTable& table) override;

  void Store(uint32_t address, ByteView bytes);
  Bytes Load(uint32_t address, size_t size) const;

 private:
  static constexpr uint32_t kPageSize = 4096;
  using Page = std::array<uint8_t, kPageSize>;

  void Peek(ByteView request, size_t element_size, Wire& wire) const;
  void Poke(ByteView request, size_t element_size, Wire& wire);

  mutable std::mutex mutex_;
  std::unordered_map<uint32_t, Page> pages_;
};

}  // namespace kral::handset

#endif
