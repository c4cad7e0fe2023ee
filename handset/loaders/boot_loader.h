// The primary boot loader: a handset that has no software running yet, and wants a flash programmer.
//
//   auto loader = std::make_shared<BootLoader>();
//   loader->SetProgrammer(flash_programmer);      // what has the line once the transfer is done
//   handset.EnterMode(loader);                    // it says hello at once
//   handset.mode().SetLoader(std::make_shared<Reappearance>(loader));  // as another device, after request 58
//
// A programmer's file begins with "VHFP" and its whole length, u32. Another one is fetched no further than that, and
// refused with a status.
#ifndef KRAL_HANDSET_LOADERS_BOOT_LOADER_H
#define KRAL_HANDSET_LOADERS_BOOT_LOADER_H

#include <memory>
#include <mutex>
#include <string>

#include "handset/line/wire.h"

namespace kral::handset {

struct BootLoaderSettings {
  uint32_t version = 2;
  uint32_t compatible_version = 1;
  uint32_t longest_command = 1024;
  uint32_t chip_identity = 0x008140E1;
  uint32_t identity_size = 24;  // bytes told for the identity, of which 24 are sent at most; 0: it has none
  uint32_t image_id = 13;
  uint32_t piece_size = 4096;  // of a read request
};

// Thread-safe.
class BootLoader final : public WireMode {
 public:
  static constexpr uint32_t kStatusDone = 0;
  static constexpr uint32_t kStatusBadImage = 1;
  static constexpr size_t kProgrammerHeader = 8;

  explicit BootLoader(BootLoaderSettings settings = {}) : settings_(settings) {}

  void OnEnter(Wire& wire) override;  // says hello, and has forgotten what was before
  size_t OnBytes(ByteView bytes, Wire& wire) override;

  // Null: silence behind the last packet.
  void SetProgrammer(std::shared_ptr<WireMode> programmer);
  void Set(BootLoaderSettings settings);

  Bytes image() const;          // what was fetched since the last hello
  bool transferred() const;     // whole, and the host was told so
  std::string problem() const;  // what the host did wrong; the loader hears nothing any more then

 private:
  enum class State { kHello, kCommand, kImage, kEnd, kOver };

  void SayHello(Wire& wire);
  void OnPacket(ByteView packet, Wire& wire);
  void OnHelloResponse(ByteView packet, Wire& wire);
  void OnCommand(ByteView packet, Wire& wire);
  void OnImage(Wire& wire);
  void Request(Wire& wire, uint32_t size);
  void EndTransfer(Wire& wire, uint32_t status);
  size_t TakeImage(ByteView bytes, Wire& wire);
  size_t TakePacket(ByteView bytes, Wire& wire);
  void Fail(std::string what, ByteView packet);

  mutable std::mutex mutex_;
  BootLoaderSettings settings_;
  std::shared_ptr<WireMode> programmer_;
  State state_ = State::kOver;
  Bytes hello_;
  Bytes packet_;  // begun, not yet whole
  Bytes image_;
  size_t requested_ = 0;  // image bytes that the host owes
  uint32_t status_ = kStatusDone;
  std::string problem_;
};

// A programmer's file of that length: the header, and bytes that differ from each other.
Bytes MakeProgrammer(size_t size);

// Has the device leave the port, and come back in another mode.
class Reappearance final : public WireMode {
 public:
  // It stays so long, for its last answer to be read, and is away so long.
  explicit Reappearance(std::shared_ptr<WireMode> mode, uint32_t linger_ms = 100, uint32_t away_ms = 200)
      : mode_(std::move(mode)), linger_ms_(linger_ms), away_ms_(away_ms) {}

  void OnEnter(Wire& wire) override { wire.Reappear(mode_, linger_ms_, away_ms_); }
  size_t OnBytes(ByteView bytes, Wire&) override { return bytes.size(); }

 private:
  const std::shared_ptr<WireMode> mode_;
  const uint32_t linger_ms_;
  const uint32_t away_ms_;
};

}  // namespace kral::handset

#endif
