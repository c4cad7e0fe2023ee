// A mobile handset made of software, as a host sees it at the end of its diagnostic cable.
//
// Bytes go in by FromHost and come out by ToHost; caller_transport.h and pty_cable.h put a cable on it. Requests are
// answered by services, of which anybody may add more; a wire mode takes the whole byte stream over. Everything here
// may be called from any thread, but handlers and wire modes, which run inside FromHost, use their Wire instead.
//
//   VirtualHandset handset;
//   handset.nv().Set(453, FromHex("01"));            // the model, for flows
//   handset.Expect("2F").Reply("2F 34 12");          // a script, for facts of the wire
//   handset.faults().Add(Lose(), When::Nth(2));      // misbehaviour
#ifndef KRAL_HANDSET_VIRTUAL_HANDSET_H
#define KRAL_HANDSET_VIRTUAL_HANDSET_H

#include <atomic>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "handset/line/bytes.h"
#include "handset/line/faults.h"
#include "handset/line/frame_codec.h"
#include "handset/line/output_line.h"
#include "handset/line/request_table.h"
#include "handset/line/script.h"
#include "handset/line/wire.h"
#include "handset/loaders/boot_loader.h"
#include "handset/loaders/flash_memory.h"
#include "handset/loaders/flash_programmer.h"
#include "handset/loaders/kova_loader.h"
#include "handset/services/defined_service.h"
#include "handset/services/efs_service.h"
#include "handset/services/ftm_service.h"
#include "handset/services/identity.h"
#include "handset/services/log_service.h"
#include "handset/services/maintenance.h"
#include "handset/services/memory.h"
#include "handset/services/nv_store.h"
#include "handset/services/operating_mode.h"
#include "platform/clock.h"

namespace kral::handset {

class VirtualHandset {
 public:
  explicit VirtualHandset(Identity identity = {}, Clock& clock = SystemClock());
  ~VirtualHandset();
  VirtualHandset(const VirtualHandset&) = delete;
  VirtualHandset& operator=(const VirtualHandset&) = delete;

  // --- The cable --------------------------------------------------------------------------------------------------
  bool FromHost(ByteView bytes);             // false when the device has vanished
  size_t ToHost(std::span<uint8_t> buffer);  // what is due, whole frames unless told to split; never waits
  bool WaitForOutput(uint32_t milliseconds) { return line_.Wait(milliseconds); }
  void Wake() { line_.Wake(); }           // ends a wait
  void DropOutput() { line_.Clear(); }    // what the host purges
  uint32_t MillisecondsToOutput() const;  // or to leaving the port
  // Called whenever output was added and when the device comes or goes; it must not call back.
  void SetOutputListener(std::function<void()> listener) { line_.SetListener(std::move(listener)); }

  void HangUp();  // unplugged: bytes of both directions are lost
  void PlugIn();  // back on the port, in the mode it starts in, with its state as it was
  bool vanished();
  // How often it has come to a port: what is plugged in again is another device to the host.
  uint32_t appearances() const { return appearances_; }
  void Restart();  // power off and on; plugged in

  // --- Behaviour --------------------------------------------------------------------------------------------------
  void On(uint8_t code, Length length, Handler handler);
  void OnSubsystem(uint8_t subsystem, uint16_t command, Length length, Handler handler);
  void AddService(std::shared_ptr<Service> service);
  // Null is the diagnostic mode.
  void EnterMode(std::shared_ptr<WireMode> mode);
  // What has the line after PlugIn and after a restart; null at first, and again once a restart finds software in
  // flash.
  void SetStartMode(std::shared_ptr<WireMode> mode);

  void SendPacket(ByteView payload);  // unsolicited, framed; of the faults it knows bit errors only
  void SendUnframed(ByteView bytes);  // the same as the bytes stand

  FaultPlan& faults() { return faults_; }
  Script::Step Expect(std::string_view request_hex) { return script_.Expect(request_hex); }
  Script& script() { return script_; }
  bool ScriptConsumed() const { return script_.Consumed(); }

  // --- The model --------------------------------------------------------------------------------------------------
  IdentityService& identity() { return *identity_; }
  OperatingMode& mode() { return *mode_service_; }
  FtmService& ftm() { return *ftm_; }
  DefinedService& defined() { return *defined_; }
  // Answers the commands of a definition file. Before it is connected; std::invalid_argument for a file of another
  // kind.
  void LoadCommands(const std::string& path);
  Memory& memory() { return *memory_; }
  Maintenance& maintenance() { return *maintenance_; }
  NvStore& nv() { return *nv_; }
  EfsService& efs() { return *efs_; }
  LogService& logs() { return *logs_; }
  FlashMemory& flash() { return flash_; }
  KovaLoader& loader() { return *loader_; }               // after the download request
  FlashProgrammer& programmer() { return *programmer_; }  // what the loaders start
  std::shared_ptr<FlashProgrammer> programmer_mode() { return programmer_; }
  // Of a handset that starts in it (SetStartMode), or is sent into it.
  const std::shared_ptr<BootLoader>& boot_loader() { return boot_loader_; }
  Clock& clock() { return clock_; }

  // --- What it has heard ------------------------------------------------------------------------------------------
  std::vector<Bytes> requests() const;  // de-framed payloads, in order
  Bytes received() const;               // every byte, as it came
  uint64_t request_count() const;       // kept without a trace as well
  uint64_t damaged_frames() const;
  bool WaitForRequests(uint64_t count, uint32_t milliseconds) const;
  void ClearTrace();
  void KeepTrace(bool keep);  // on at first; off for long runs

 private:
  class HandsetWire;

  // A way off the port and back to it.
  struct Journey {
    std::shared_ptr<WireMode> mode;
    uint32_t leave_tick = 0;
    uint32_t return_tick = 0;
    bool left = false;
  };

  void Travel();
  void ResetLocked();
  void PlugInLocked(std::shared_ptr<WireMode> mode);
  void OnRequestLocked(ByteView request);
  size_t ReadDiagnosticLocked(ByteView bytes);
  bool SwitchModeLocked();
  void RestartLocked(uint32_t silent_ms);
  void EmitLocked(ByteView bytes, bool framed, uint32_t delay_ms);
  void AddServiceLocked(std::shared_ptr<Service> service);

  Clock& clock_;
  OutputLine line_;
  FaultPlan faults_;
  Script script_;
  std::atomic<bool> vanished_ = false;
  std::atomic<uint32_t> appearances_ = 1;
  std::atomic<bool> travelling_ = false;

  mutable std::mutex mutex_;  // of everything below, held while handlers and wire modes run
  mutable std::condition_variable heard_;
  RequestTable table_;
  std::vector<std::shared_ptr<Service>> services_;
  FrameDecoder decoder_;
  std::unique_ptr<HandsetWire> wire_;
  std::shared_ptr<WireMode> mode_;  // null: diagnostic
  std::shared_ptr<WireMode> start_mode_;
  std::optional<Journey> journey_;
  std::optional<std::shared_ptr<WireMode>> next_mode_;
  std::optional<Strike> strike_;  // of the request being answered
  std::vector<Bytes> requests_;
  Bytes received_;
  uint64_t request_count_ = 0;
  bool keep_trace_ = true;

  std::shared_ptr<IdentityService> identity_;
  std::shared_ptr<NvStore> nv_;
  std::shared_ptr<EfsService> efs_;
  std::shared_ptr<LogService> logs_;
  std::shared_ptr<OperatingMode> mode_service_;
  std::shared_ptr<FtmService> ftm_;
  const std::shared_ptr<DefinedService> defined_ = std::make_shared<DefinedService>();
  std::shared_ptr<Memory> memory_;
  std::shared_ptr<Maintenance> maintenance_;
  FlashMemory flash_;
  std::shared_ptr<FlashProgrammer> programmer_;
  std::shared_ptr<KovaLoader> loader_;
  std::shared_ptr<BootLoader> boot_loader_;
};

}  // namespace kral::handset

#endif
