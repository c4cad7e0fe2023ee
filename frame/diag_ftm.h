// The phone object: everything the library keeps for one handset. It owns the transport, the packet buffers, the
// queues, the text log, the time-outs and the settings; the command families are functions over it.
#ifndef KRAL_FRAME_DIAG_FTM_H
#define KRAL_FRAME_DIAG_FTM_H

#include <array>
#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <span>

#include "base/diag_packet.h"
#include "base/text_log.h"
#include "base/time_outs.h"
#include "frame/phone_state.h"
#include "kral/connection.h"
#include "platform/clock.h"
#include "transport/collection/capture_player.h"
#include "transport/collection/kral_event_listener.h"
#include "transport/engine/kral_thread_interface.h"

namespace kral {

inline constexpr uint8_t kTargetModem = KRAL_TARGET_MODEM;              // the diagnostic service runs on the modem chip
inline constexpr uint8_t kTargetApplication = KRAL_TARGET_APPLICATION;  // ... on an application processor

class CaptureWriter;
struct CaptureLayout;
class NameTables;
class OrbtServer;
class TraceWriter;

struct OpenArguments {
  uint32_t port = 0;  // as given by the caller; the object's own port number is what is opened
  uint32_t handle = 0;
  UserTransport user;  // all empty: the COM port
  bool handshake = false;
  bool second_flag = false;
};

class Diag_FTM {
 public:
  // Direct mode: owns a transport over COM `port`.
  explicit Diag_FTM(uint16_t port, Clock& clock = SystemClock(), DeviceOpener opener = OpenComPort);
  // Server mode: talks through the server.
  Diag_FTM(std::shared_ptr<OrbtServer> server, uint16_t port, Clock& clock = SystemClock());
  ~Diag_FTM();
  Diag_FTM(const Diag_FTM&) = delete;
  Diag_FTM& operator=(const Diag_FTM&) = delete;

  // --- Connection -------------------------------------------------------------------------------------------------
  // Remembers the caller's functions: a port that is closed later is reopened with them, and otherwise with all zero.
  bool OpenPort(const OpenArguments& arguments);
  // How often it was told to. What is known of the handset that was there before is then known no longer.
  uint32_t connects() const { return connects_; }
  bool ClosePort();
  bool IsPhoneConnected();
  // Asks the diagnostic service of an application processor for a sign of life, with time-out 1.
  bool IsDiagServiceAlive();
  // Direct mode: reopens a closed port.
  bool IsPortOpen();
  // For a protocol that has the bytes of the port for itself: ends the connection and opens its port, or binds the
  // caller's functions, without a receive thread; what the device has sent already is kept. No request opens the
  // connection until the port is given back or somebody connects again. Null when it does not open, with the reason
  // in the port's open_result(), and where there is none: server mode, null port.
  CSerialPort* BorrowPort();
  void GiveBackPort();  // closes it; the next request opens the connection
  bool port_borrowed() const { return port_borrowed_; }
  // Unplugged, as far as the library's own port knows: nothing more comes.
  bool device_gone() const;
  // Closes the port for good, once a running request has ended: its context is being released, and a request of
  // another thread that still holds the object must not open the port again.
  void Retire();

  // --- Requests ---------------------------------------------------------------------------------------------------
  // Held for a whole operation by ExportCall::Run; recursive, so that operations may be built from operations.
  std::recursive_mutex& request_lock() { return request_lock_; }

  // One call of the caller's, under that lock: where the cable was pulled and plugged in again before it, sooner than
  // anybody has noticed, its first request goes to the device that is there now. Further ones, and those of jobs, fail
  // as lost: half of a transfer must not go to whoever came back. Where whoever it is will do, IsPortOpen takes him.
  // Between two requests of a job handsets come and go; it sees for itself who is there.
  class Call {
   public:
    explicit Call(Diag_FTM& phone) : lock_(phone.request_lock_), phone_(phone) {
      phone_.at_calls_begin_ = true;
      ++phone_.calls_;
    }
    ~Call() {
      phone_.at_calls_begin_ = false;
      --phone_.calls_;
    }
    Call(const Call&) = delete;
    Call& operator=(const Call&) = delete;

   private:
    const std::lock_guard<std::recursive_mutex> lock_;
    Diag_FTM& phone_;
  };

  // The default buffer of all commands; by index 1 that of EFS2 requests beside one under way, and 2, which is spare.
  CDiagPacket& packet(size_t index = 0) { return packets_[index]; }

  // Sends the buffer's request and awaits the reply that begins with the request's first byte, into the buffer's
  // response. No reply within the time-out closes the port; any other first reply is in the buffer, too. `is_own` tells
  // the reply from one to an earlier request (CKralThreadInterface::SendSync). What went wrong has been noted as the
  // failure of the exported call under way.
  Reply Send(CDiagPacket& packet, uint32_t time_out_ms, uint32_t delay_ms = 0, const ReplyTest& is_own = {});
  Reply Send(CDiagPacket& packet) { return Send(packet, TimeOut(kTimeOutDefaultCommand)); }

  // After a request whose answer is still owed the next one may be answered by it, where the reply does not tell. With
  // this on, Send and Synchronise ask for a loopback first, which tells: what comes in front of its echo is passed
  // over.
  void SetResynchronise(bool on) { resynchronise_ = on; }
  // Asks for it where it is due. `passed_over` sees the replies in front. Not the echo within the time-out: the request
  // that was to follow counts as not answered, and is better not sent.
  Reply Synchronise(uint32_t time_out_ms);
  // After a request whose answer nobody awaits any more.
  void OweAnswer();
  // Whether such an answer may come instead of the next request's.
  bool MayGetLateAnswer() const;

  // On for as long as it lives, whatever the caller has set. For whoever holds the request lock.
  class Resynchronising {
   public:
    explicit Resynchronising(Diag_FTM& phone) : phone_(phone) { ++phone_.resynchronising_; }
    ~Resynchronising() { --phone_.resynchronising_; }
    Resynchronising(const Resynchronising&) = delete;
    Resynchronising& operator=(const Resynchronising&) = delete;

   private:
    Diag_FTM& phone_;
  };

  // The same over the caller's memory.
  Reply SendSync(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code, uint32_t time_out_ms,
                 uint32_t delay_ms = 0, const ReplyTest& is_own = {});
  // Once more awaits the reply to the request that Send has sent, behind one that answered something else. Through a
  // phone server no reply comes unasked.
  Reply AwaitNext(CDiagPacket& packet, uint32_t time_out_ms, const ReplyTest& is_own = {});

  // Direct mode: opens the port, and sends as the transport does. What went wrong has been noted.
  Reply SendRaw(std::span<const uint8_t> request, std::span<uint8_t> room, uint32_t time_out_ms);
  Reply SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag);

  // --- Collection (diag_ftm_collection.cpp) -----------------------------------------------------------------------
  TrafficCounters counters();
  // From now on collected packets go to this file as well.
  bool StartCapture(const char* file_name, const CaptureLayout& layout, uint32_t keep);
  bool StopCapture();  // true when everything collected is in the file
  // A file's packets come as if the handset had sent them.
  bool StartPlayback(const char* file_name, PlayPace pace, const CaptureStretch& stretch);
  // From now on every byte of the port goes to this file, or the latest are kept for SaveTrace.
  bool StartTrace(const char* file_name);
  bool StopTrace();  // true when everything that passed is in the file
  bool KeepTrace(uint32_t bytes);
  bool SaveTrace(const char* file_name);

  // --- Time-outs --------------------------------------------------------------------------------------------------
  bool ConfigureTimeOut(uint32_t id, int32_t milliseconds);  // logged
  int32_t GetTimeOut(uint32_t id);                           // logged
  uint32_t TimeOut(uint32_t id) const;                       // silent; 0 for an unknown id

  // --- Owned parts ------------------------------------------------------------------------------------------------
  DataLogFileHandler& log();
  CKralThreadInterface& transport();  // direct mode only
  CKralEventListener& sorter();
  CKralEvents& dispatcher();
  PacketQueue& responses();
  PacketQueue& asynchronous();
  BoundedQueue<EventRecord>& events();
  NameTables& names();
  CaptureWriter& capture();
  CapturePlayer& player();
  TraceWriter& trace();
  Clock& clock() { return clock_; }
  // Keeps log, queues and transport: for a family's thread that may outlive its operation.
  std::shared_ptr<void> KeepParts();

  // --- Settings ---------------------------------------------------------------------------------------------------
  bool server_mode() const { return server_ != nullptr; }
  OrbtServer* server_port() { return server_.get(); }
  bool connected() const { return connected_; }
  uint16_t port() const { return port_; }
  uint8_t target_type() const { return target_type_; }
  void SetTargetType(uint8_t type);  // values above 1 are ignored
  uint32_t handle() const { return handle_; }
  void SetHandle(uint32_t handle) { handle_ = handle; }
  bool SetReceiveMode(ReceiveMode mode);  // false in server mode, which has no receive thread
  void SetData2DiagSearch(bool on) { data_to_diagnostic_search_ = on; }
  bool data_to_diagnostic_search() const { return data_to_diagnostic_search_; }
  bool framed() const { return framed_; }  // false in the unframed packet modes
  void SetFramed(bool framed) { framed_ = framed; }

  // What a family keeps for this handset, across its connects: phone.state<efs::Settings>(). The first to ask makes it.
  template <class T>
  T& state() {
    return state_.Get<T>();
  }

 private:
  struct Parts;  // what the threads of the connection keep alive

  void ApplyDefaults();
  void ReadStationFile();
  bool Reopen();
  bool Open(const OpenArguments& arguments);
  void OpenThroughServer();
  void OpenDirect(const OpenArguments& arguments);
  void UnregisterFromServer();
  void EndCollection();
  bool IsLoopbackAnswered();
  bool IsVersionAnswered();
  template <class SendOnce>
  Reply OverOpenPort(SendOnce send);
  Reply SendThroughServer(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                          uint32_t time_out_ms);
  Reply Noted(Reply reply, std::span<const uint8_t> request, uint32_t time_out_ms);

  std::recursive_mutex request_lock_;
  Clock& clock_;
  const std::shared_ptr<OrbtServer> server_;  // null in direct mode
  const uint16_t port_;
  std::shared_ptr<Parts> parts_;
  struct StopDispatching {
    void operator()(CKralEvents* dispatcher) const;
  };
  std::unique_ptr<CKralEvents, StopDispatching> dispatching_;  // null in server mode
  std::array<CDiagPacket, 3> packets_;
  PhoneState state_;

  UserTransport user_;  // of the last explicit open
  bool null_port_ = false;
  bool listener_registered_ = false;  // server mode
  bool at_calls_begin_ = false;       // no request of the caller's call has been sent
  int calls_ = 0;                     // of the caller, under way: one may be made in a callback of another
  bool answer_owed_ = false;          // by the handset, to a request that was given up
  uint32_t owed_since_ = 0;
  uint32_t resynchronising_ = 0;
  uint32_t loopbacks_ = 0;  // numbers those that resynchronise
  bool retired_ = false;
  bool port_borrowed_ = false;

  // Read and set without the request lock.
  std::array<std::atomic<uint32_t>, kTimeOutCount> time_outs_{};
  std::atomic<bool> connected_{false};
  uint32_t connects_ = 0;
  std::atomic<uint8_t> target_type_{kTargetModem};
  std::atomic<uint32_t> handle_{0};
  std::atomic<bool> data_to_diagnostic_search_{true};
  std::atomic<bool> framed_{true};
  std::atomic<bool> resynchronise_{false};
};

}  // namespace kral

#endif
