// Serial ports of the machine, listed without opening any, and the COM numbers they go by.
#ifndef KRAL_PLATFORM_PORT_LIST_H
#define KRAL_PLATFORM_PORT_LIST_H

#include <cstdint>
#include <string>
#include <vector>

namespace kral {

// COM numbers in the system's order: the serial-device map of the registry, or sysfs together with the names told
// below. False when the system's list cannot be read.
bool ListComPorts(std::vector<uint16_t>& ports);

// The device that a COM number stands for. Windows: \\.\COMn. Linux, first hit wins: the environment variable
// KRAL_COM<n>; the link com<n> in $KRAL_PORT_DIR, else in kral/ports under $XDG_CONFIG_HOME (~/.config), else in
// /etc/kral/ports; else ttyS0.. from 1, ttyUSB0.. from 65, ttyACM0.. from 129.
std::string ComPortDevice(int number);

}  // namespace kral

#endif
