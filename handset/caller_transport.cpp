// Carries bytes between a library that polls and a handset in the same process; never waits.
#include "handset/caller_transport.h"

namespace kral::handset {
namespace {

constexpr uint32_t kDone = 0;
constexpr uint32_t kFailed = 1;

}  // namespace

uint32_t KRAL_CALL CallerTransport::Send(uintptr_t context, uintptr_t handle, uint32_t count, const uint8_t* data,
                                         uint32_t* written) {
  CallerTransport* self = Of(context, handle);
  if (self == nullptr || data == nullptr || written == nullptr) return kFailed;
  if (!self->handset_.FromHost({data, count})) return kFailed;
  *written = count;
  return kDone;
}

uint32_t KRAL_CALL CallerTransport::Receive(uintptr_t context, uintptr_t handle, uint32_t* count, uint8_t* buffer) {
  CallerTransport* self = Of(context, handle);
  if (self == nullptr || count == nullptr || buffer == nullptr || self->handset_.vanished()) return kFailed;
  *count = static_cast<uint32_t>(self->handset_.ToHost({buffer, *count}));
  return kDone;
}

uint32_t KRAL_CALL CallerTransport::Flush(uintptr_t context, uintptr_t handle) {
  CallerTransport* self = Of(context, handle);
  if (self == nullptr) return kFailed;
  ++self->flushes_;
  self->handset_.DropOutput();
  return kDone;
}

CallerTransport* CallerTransport::Of(uintptr_t context, uintptr_t handle) {
  return handle == kHandleValue ? reinterpret_cast<CallerTransport*>(context) : nullptr;
}

}  // namespace kral::handset
