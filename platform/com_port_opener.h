// Opens a COM port time and again for one connection.
#ifndef KRAL_PLATFORM_COM_PORT_OPENER_H
#define KRAL_PLATFORM_COM_PORT_OPENER_H

#include <atomic>
#include <cstdint>
#include <memory>

#include "platform/serial_device.h"

namespace kral {

// On Linux a number has a row of names (platform/port_list.h), and the first that is there counts. When a device goes
// and its name with it, as udev takes links away, the next name in the row leads to another device. So a port is opened
// again by the name that it was opened by, wherever that leads now, or by one in front of it; those behind it do not
// stand in for it. On Windows the number is the name.
//
// Copies are one: what opens, and what forgets. For any thread.
class ComPortOpener {
 public:
  std::unique_ptr<SerialDevice> operator()(int number, DeviceResult& result) const;
  void Forget() const { *last_place_ = kAnyPlace; }  // what is opened next is chosen anew

 private:
  static constexpr uint32_t kAnyPlace = UINT32_MAX;

  std::shared_ptr<std::atomic<uint32_t>> last_place_ = std::make_shared<std::atomic<uint32_t>>(kAnyPlace);
};

}  // namespace kral

#endif
