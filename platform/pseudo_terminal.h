// The far end of a serial line made of software: what is written here is read by whoever opens device_path().
#ifndef KRAL_PLATFORM_PSEUDO_TERMINAL_H
#define KRAL_PLATFORM_PSEUDO_TERMINAL_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

namespace kral {

// The destructor hangs up: a device that is open on the other side sees its port vanish.
//
// Read, Write and WaitReadable belong to one thread; Wake may be called from any.
class PseudoTerminal {
 public:
  virtual ~PseudoTerminal() = default;

  virtual const std::string& device_path() const = 0;

  // Takes what fits; fewer bytes than given when nobody reads on the other side. Never waits.
  virtual size_t Write(std::span<const uint8_t> bytes) = 0;

  // Returns at once with what has arrived, 0 bytes included.
  virtual size_t Read(std::span<uint8_t> buffer) = 0;

  // Waits until bytes can be read (true), or until Wake or the time-out (false). A Wake that comes before the wait
  // is not lost: it ends the next one.
  virtual bool WaitReadable(uint32_t milliseconds) = 0;
  virtual void Wake() = 0;
};

// Opens one in raw mode. Null with a sentence in `error` where the system refuses; Windows has none.
std::unique_ptr<PseudoTerminal> OpenPseudoTerminal(std::string& error);

}  // namespace kral

#endif
