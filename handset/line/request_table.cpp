// Finds the handler of a request; unknown commands and wrong lengths never reach one.
#include "handset/line/request_table.h"

namespace kral::handset {
namespace {

constexpr size_t kSubsystemHeader = 4;

// Keys of the three kinds of entries, which never meet.
uint32_t CodeKey(uint8_t code) {
  return 0x01000000u | code;
}
uint32_t SubsystemKey(uint8_t subsystem) {
  return 0x02000000u | subsystem;
}
uint32_t CommandKey(uint8_t subsystem, uint16_t command) {
  return 0x03000000u | uint32_t{subsystem} << 16 | command;
}

}  // namespace

void Refuse(Refusal refusal, ByteView request, Wire& wire) {
  wire.Send(ByteWriter().U8(static_cast<uint8_t>(refusal)).Raw(request).Take());
}

void RequestTable::On(uint8_t code, Length length, Handler handler) {
  entries_[CodeKey(code)] = {length, std::move(handler)};
}

void RequestTable::OnSubsystem(uint8_t subsystem, uint16_t command, Length length, Handler handler) {
  entries_[CommandKey(subsystem, command)] = {length, std::move(handler)};
}

void RequestTable::OnSubsystem(uint8_t subsystem, Length length, Handler handler) {
  entries_[SubsystemKey(subsystem)] = {length, std::move(handler)};
}

void RequestTable::Answer(ByteView request, Wire& wire) const {
  const Entry* entry = Find(request);
  if (entry == nullptr) return Refuse(Refusal::kBadCommand, request, wire);
  if (request.size() < entry->length.least || request.size() > entry->length.most) {
    return Refuse(Refusal::kBadLength, request, wire);
  }
  entry->handler(request, wire);
}

const RequestTable::Entry* RequestTable::Find(ByteView request) const {
  const auto find = [this](uint32_t key) {
    const auto found = entries_.find(key);
    return found == entries_.end() ? nullptr : &found->second;
  };
  if (request.empty()) return nullptr;
  if (request[0] != kSubsystemDispatch) return find(CodeKey(request[0]));
  if (request.size() < kSubsystemHeader) return nullptr;
  if (const Entry* entry = find(CommandKey(request[1], GetU16(request, 2)))) return entry;
  return find(SubsystemKey(request[1]));
}

}  // namespace kral::handset
