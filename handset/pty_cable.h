// The cable to another process: a virtual handset at the far end of a pseudo terminal.
#ifndef KRAL_HANDSET_PTY_CABLE_H
#define KRAL_HANDSET_PTY_CABLE_H

#include <atomic>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "handset/byte_rate.h"
#include "handset/virtual_handset.h"
#include "platform/pseudo_terminal.h"

namespace kral::handset {

// Serves the handset on a thread of its own until it is destroyed. When the handset hangs up the terminal goes, as a
// device that is unplugged does; when it is plugged in again it comes back as another terminal.
class PtyCable {
 public:
  // `link` is kept as a symbolic link to the terminal while there is one; empty for none. Null with a sentence in
  // `error` where the system refuses. The handset outlives the cable, and has one cable at a time.
  // `bytes_per_second` is what the cable carries in each direction; 0: as much as there is.
  static std::unique_ptr<PtyCable> Attach(VirtualHandset& handset, std::string link, std::string& error,
                                          uint32_t bytes_per_second = 0);
  ~PtyCable();
  PtyCable(const PtyCable&) = delete;
  PtyCable& operator=(const PtyCable&) = delete;

  std::string device_path() const;  // empty while the device has vanished

 private:
  PtyCable(VirtualHandset& handset, std::string link, uint32_t bytes_per_second);

  bool Plug(std::string& error);
  void Unplug();
  void Run();
  void Serve();
  bool Write();
  void AwaitReturn();

  VirtualHandset& handset_;
  const std::string link_;
  ByteRate from_host_;
  ByteRate to_host_;
  mutable std::mutex mutex_;  // of the terminal's pointer, against wakes from other threads
  std::unique_ptr<PseudoTerminal> terminal_;
  uint32_t appearance_ = 0;  // of the handset that has the terminal
  Bytes chunk_;  // its bytes from chunk_begin_ to chunk_end_ are taken from the handset, not yet by the terminal
  size_t chunk_begin_ = 0;
  size_t chunk_end_ = 0;
  std::atomic<bool> stop_ = false;
  std::thread thread_;
};

}  // namespace kral::handset

#endif
