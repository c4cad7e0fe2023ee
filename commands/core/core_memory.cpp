// Reads and writes the handset's memory, byte, word or double word at a time.
#include <span>

#include "base/little_endian.h"
#include "base/outputs.h"
#include "commands/core/core_diag.h"
#include "commands/core/core_diag_format.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"

namespace kral::diag {
namespace {

bool IsMissing(Diag_FTM& phone, const char* name, const void* data, uint16_t count) {
  if (data != nullptr || count == 0) return false;
  phone.log().WriteLine(kLogErr, "%s() -- no data buffer", name);
  Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer for the data"));
  return true;
}

template <class Element>
bool Peek(Diag_FTM& phone, const char* name, const DiagRequest<u32, u16>& row, uint32_t address, uint16_t count,
          Element* data) {
  phone.log().WriteLine(kLogFn, "%s()", name);
  if (IsMissing(phone, name, data, count) || !Send(phone, row, address, count)) return false;
  const auto reply = phone.packet().response();
  const size_t wanted = size_t{count} * sizeof(Element);
  if (reply.size() <= wanted) {  // the command code is never data
    phone.log().WriteLine(kLogErr, "%s() -- reply of %d bytes holds fewer than %d of data", name,
                          static_cast<int>(reply.size()), static_cast<int>(wanted));
    return Fail(BadReply(phone, "holds fewer data than were asked for"));
  }
  const auto memory = reply.last(wanted);
  for (size_t i = 0; i < count; ++i) data[i] = *LoadLe<Element>(memory, i * sizeof(Element));
  return true;
}

template <class Element>
bool Poke(Diag_FTM& phone, const char* name, const DiagRequest<u32, u16, std::span<const Element>>& row,
          uint32_t address, uint16_t count, const Element* data, uint8_t* status) {
  phone.log().WriteLine(kLogFn, "%s()", name);
  if (IsMissing(phone, name, data, count)) return false;
  if (!Send(phone, row, address, count, std::span(data, count))) return false;
  uint8_t reported = 0;
  if (!phone.packet().Read8(reported)) return Fail(BadReply(phone, "has no status"));
  Put(status, reported);
  return true;
}

}  // namespace

bool PeekBytes(Diag_FTM& phone, uint32_t address, uint16_t count, uint8_t* data) {
  return Peek(phone, "KRAL_DIAG_MEMORY_PEEK_F", kPeekBytes, address, count, data);
}

bool PeekWords(Diag_FTM& phone, uint32_t address, uint16_t count, uint16_t* data) {
  return Peek(phone, "KRAL_DIAG_MEMORY_PEEK_WORD_F", kPeekWords, address, count, data);
}

bool PeekDoubleWords(Diag_FTM& phone, uint32_t address, uint16_t count, uint32_t* data) {
  return Peek(phone, "KRAL_DIAG_MEMORY_PEEK_DWORD_F", kPeekDoubleWords, address, count, data);
}

bool PokeBytes(Diag_FTM& phone, uint32_t address, uint16_t count, const uint8_t* data, uint8_t* status) {
  return Poke(phone, "KRAL_DIAG_MEMORY_POKE_F", kPokeBytes, address, count, data, status);
}

bool PokeWords(Diag_FTM& phone, uint32_t address, uint16_t count, const uint16_t* data, uint8_t* status) {
  return Poke(phone, "KRAL_DIAG_MEMORY_POKE_WORD_F", kPokeWords, address, count, data, status);
}

bool PokeDoubleWords(Diag_FTM& phone, uint32_t address, uint16_t count, const uint32_t* data, uint8_t* status) {
  return Poke(phone, "KRAL_DIAG_MEMORY_POKE_DWORD_F", kPokeDoubleWords, address, count, data, status);
}

}  // namespace kral::diag
