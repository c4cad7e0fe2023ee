// A serial device that holds nothing and obeys in silence: what a fake does not care about.
#ifndef KRAL_TESTS_SUPPORT_FAKE_DEVICE_H
#define KRAL_TESTS_SUPPORT_FAKE_DEVICE_H

#include "platform/serial_device.h"

namespace kral::test {

class FakeDevice : public SerialDevice {
 public:
  size_t OutputRoom() override { return 4096; }
  size_t InputWaiting() override { return 0; }
  bool gone() const override { return false; }
  void Wake() override {}
  DeviceResult SetBaudRate(uint32_t) override { return {}; }
  uint32_t BaudRate() const override { return 115200; }
  DeviceResult SetDtr(bool) override { return {}; }
  DeviceResult SetRts(bool) override { return {}; }
  void PurgeInput() override {}
  void PurgeBoth() override { PurgeInput(); }
};

}  // namespace kral::test

#endif
