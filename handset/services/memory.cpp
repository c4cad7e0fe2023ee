// Peek and poke over a sparse memory. Ranges may wrap around at the end of the address space.
#include "handset/services/memory.h"

namespace kral::handset {
namespace {

constexpr uint8_t kPeekBytes = 2;
constexpr uint8_t kPokeBytes = 5;
constexpr size_t kMemoryHeaderSize = 7;  // code, address, count
// What a reply can hold besides its header.
constexpr size_t kMostBytes = 4000;
constexpr uint8_t kStored = 0;

}  // namespace

void Memory::Register(RequestTable& table) {
  for (uint8_t width = 0; width < 3; ++width) {
    const size_t element_size = size_t{1} << width;
    table.On(static_cast<uint8_t>(kPeekBytes + width), Length::Exactly(kMemoryHeaderSize),
             [this, element_size](ByteView request, Wire& wire) { Peek(request, element_size, wire); });
    table.On(static_cast<uint8_t>(kPokeBytes + width), Length::AtLeast(kMemoryHeaderSize),
             [this, element_size](ByteView request, Wire& wire) { Poke(request, element_size, wire); });
  }
}

void Memory::Store(uint32_t address, ByteView bytes) {
  const std::lock_guard lock(mutex_);
  for (const uint8_t byte : bytes) {
    const auto [page, added] = pages_.try_emplace(address / kPageSize);
    if (added) page->second.fill(kErased);
    page->second[address % kPageSize] = byte;
    ++address;
  }
}

Bytes Memory::Load(uint32_t address, size_t size) const {
  Bytes bytes(size, kErased);
  const std::lock_guard lock(mutex_);
  for (uint8_t& byte : bytes) {
    if (const auto page = pages_.find(address / kPageSize); page != pages_.end()) {
      byte = page->second[address % kPageSize];
    }
    ++address;
  }
  return bytes;
}

void Memory::Peek(ByteView request, size_t element_size, Wire& wire) const {
  const size_t size = GetU16(request, 5) * element_size;
  if (size > kMostBytes) return Refuse(Refusal::kBadParameter, request, wire);
  wire.Send(ByteWriter().Raw(request).Raw(Load(GetU32(request, 1), size)).Take());
}

void Memory::Poke(ByteView request, size_t element_size, Wire& wire) {
  const ByteView data = request.subspan(kMemoryHeaderSize);
  if (data.size() != GetU16(request, 5) * element_size) return Refuse(Refusal::kBadLength, request, wire);
  Store(GetU32(request, 1), data);
  wire.Send(ByteWriter().Raw(request.first(kMemoryHeaderSize)).U8(kStored).Take());
}

}  // namespace kral::handset
