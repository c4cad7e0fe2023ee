// The cable inside one process: the three functions of a caller-supplied transport, served by a virtual handset.
#ifndef KRAL_HANDSET_CALLER_TRANSPORT_H
#define KRAL_HANDSET_CALLER_TRANSPORT_H

#include <atomic>
#include <cstdint>

#include "handset/virtual_handset.h"
#include "kral/types.h"

namespace kral::handset {

// The context value is the address of this object, which must outlive the connection, as must the handset.
class CallerTransport {
 public:
  // Comes back with every call as the caller's handle value.
  static constexpr uintptr_t kHandleValue = 0x4B52414C;

  explicit CallerTransport(VirtualHandset& handset) : handset_(handset) {}
  CallerTransport(const CallerTransport&) = delete;
  CallerTransport& operator=(const CallerTransport&) = delete;

  uintptr_t context() const { return reinterpret_cast<uintptr_t>(this); }
  uintptr_t handle_value() const { return kHandleValue; }

  // 0 is success. They fail once the device has vanished, and when the values handed back are not the ones given.
  static uint32_t KRAL_CALL Send(uintptr_t context, uintptr_t handle, uint32_t count, const uint8_t* data,
                                 uint32_t* written);
  static uint32_t KRAL_CALL Receive(uintptr_t context, uintptr_t handle, uint32_t* count, uint8_t* buffer);
  static uint32_t KRAL_CALL Flush(uintptr_t context, uintptr_t handle);

  uint32_t flushes() const { return flushes_; }

 private:
  static CallerTransport* Of(uintptr_t context, uintptr_t handle);

  VirtualHandset& handset_;
  std::atomic<uint32_t> flushes_ = 0;
};

}  // namespace kral::handset

#endif
