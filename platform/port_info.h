// What the system knows of one serial port, without opening it.
#ifndef KRAL_PLATFORM_PORT_INFO_H
#define KRAL_PLATFORM_PORT_INFO_H

#include <cstdint>
#include <string>

namespace kral {

// What stands in the way of opening a port, as far as that can be told without trying.
enum class PortObstacle { kNone, kNotFound, kNotPermitted, kInUse, kInUseHere };

struct PortInfo {
  std::string device;  // as it is opened; empty when the number stands for none
  std::string description;
  // Only of USB devices. The path names the socket, not what is plugged into it: "1-4.2". One device may have several
  // ports, which differ by their interface.
  std::string usb_path;
  uint8_t usb_interface = 0;
  uint16_t vendor = 0;
  uint16_t product = 0;
  std::string serial;

  PortObstacle obstacle = PortObstacle::kNone;
  // Who has it open, this process included. Not every system tells of every process: 0 for nobody known.
  uint32_t process = 0;
  std::string process_name;
};

PortInfo DescribeComPort(int number);

}  // namespace kral

#endif
