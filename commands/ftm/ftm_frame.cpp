// Builds FTM headers and sends FTM requests; what a command means is left to its family.
#include "commands/ftm/ftm_frame.h"

#include <algorithm>
#include <array>

#include "commands/ftm/ftm_mode.h"
#include "commands/ftm/ftm_sequencer.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"

namespace kral::ftm {
namespace {

constexpr u16 kLegacySelector = 0x0077;
constexpr size_t kLegacyLengthOffset = 3;
constexpr u16 kLegacyLengthBase = 5;  // the length byte counts what stands behind offset 4
constexpr size_t kLegacyEcho = 3;     // a reply under code 59 repeats the code and the selector
constexpr size_t kEcho = 6;           // ... under code 75 subsystem, mode id and command id as well

constexpr u32 kLayerSent = 0;
constexpr u32 kLayerFailed = 1;
constexpr u32 kLayerHeldBack = 18;

// The request data length per command; whatever is not listed goes out as 0.
struct DataLength {
  u16 command;
  u16 length;
};

constexpr bool SortedByCommand(std::span<const DataLength> table) {
  return std::ranges::is_sorted(table, {}, &DataLength::command);
}

constexpr std::array kEvdoLengths = {
    DataLength{113, 24}, DataLength{114, 10}, DataLength{115, 16}, DataLength{116, 36}, DataLength{117, 47},
    DataLength{118, 10}, DataLength{122, 8},  DataLength{124, 2},  DataLength{125, 31}, DataLength{126, 42},
    DataLength{127, 9},  DataLength{131, 20}, DataLength{132, 36}, DataLength{133, 12}, DataLength{134, 13},
};
static_assert(SortedByCommand(kEvdoLengths));

constexpr std::array kAgpsLengths = {
    DataLength{0, 11}, DataLength{1, 11}, DataLength{2, 10},  DataLength{3, 10},
    DataLength{4, 11}, DataLength{5, 23}, DataLength{6, 524}, DataLength{122, 10},
};
static_assert(SortedByCommand(kAgpsLengths));

u16 LengthIn(std::span<const DataLength> table, u16 command) {
  const auto row = std::ranges::lower_bound(table, command, {}, &DataLength::command);
  return row != table.end() && row->command == command ? row->length : u16{0};
}

Reply TransmitLegacy(Diag_FTM& phone) {
  CDiagPacket& packet = phone.packet();
  // One byte wide: a request of more than 260 bytes goes out with its length modulo 256.
  packet.request_area()[kLegacyLengthOffset] = static_cast<u8>(packet.request_length() - kLegacyLengthBase);
  const Reply reply = phone.Send(packet);
  if (!reply) return reply;
  const auto request = packet.request();
  const auto response = packet.response();
  if (response.size() < kLegacyEcho || !std::equal(request.begin(), request.begin() + kLegacyEcho, response.begin())) {
    Fail(BadReply(phone, "does not repeat code and selector"));
    return {ReplyKind::kOther, reply.code(), reply.bytes()};
  }
  // Handsets pad this reply behind what the request's layout tells: the tail readers go on at the request's length.
  u8 surplus = 0;
  for (size_t size = response.size(); size > request.size(); --size) packet.Read8(surplus);
  return reply;
}

// The sequencer's queue takes the request instead of the port.
bool Enqueue(Diag_FTM& phone, FtmSequencer& sequencer) {
  const auto request = phone.packet().request();
  u16 sequence_id = 0;
  bool added = sequencer.Add(request, sequence_id);
  if (!added) {
    phone.log().WriteLine(kLogRet, "m_Command_Queue_Buffer is full, needs to send %d commands to sequencer",
                          static_cast<int>(sequencer.queued()));
    const bool sent = sequencer.SendQueue(phone);
    sequencer.ClearQueue();
    added = sent && sequencer.Add(request, sequence_id);
  }
  if (!added) {
    phone.log().WriteLine(kLogErr, "Failed to add command to queue");
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the sequencer's queue did not take the request"));
  }
  phone.state<Settings>().sequence_id = sequence_id;
  phone.log().WriteLine(kLogRet, "Assigned Sequence ID=%d", sequence_id);
  return true;
}

u32 SendAtOnce(Diag_FTM& phone, Reply& reply) {
  reply = SendEchoed(phone, phone.TimeOut(kTimeOutDefaultCommand), kEcho, kEcho);
  if (reply) return kLayerSent;
  phone.packet().set_response_length(0);
  return kLayerFailed;
}

bool IsSequencerCommand(std::span<const u8> request) {
  return request.size() > 4 && request[0] == kSubsystemDispatch && request[1] == kSubsystem &&
         request[2] == kModeIdSequencer;
}

u32 ProcessClientRequestPacket(Diag_FTM& phone, Reply& reply) {
  const auto request = phone.packet().request();
  phone.log().WriteLine(kLogFn, "FTM_Sequencer_ProcessClientRequestPacket( iRequestPacketSize = %d )",
                        static_cast<int>(request.size()));
  FtmSequencer* sequencer = phone.state<Settings>().sequencer;
  if (sequencer == nullptr) return SendAtOnce(phone, reply);
  if (IsSequencerCommand(request)) return sequencer->Process(phone, request);
  if (sequencer->active()) sequencer->Observe(request);
  if (sequencer->holds_back()) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "the request is held back by the sequencer"));
    return kLayerHeldBack;
  }
  return SendAtOnce(phone, reply);
}

}  // namespace

size_t HeaderSize(Diag_FTM& phone) {
  return phone.state<Settings>().command_code == kCommandCode59 ? 7 : 6;
}

void BeginHeader(Diag_FTM& phone, u16 mode_id) {
  CDiagPacket& packet = phone.packet();
  packet.Reset();
  const Settings& settings = phone.state<Settings>();
  packet.Append8(static_cast<u8>(settings.command_code));
  if (settings.command_code == kCommandCode59) {
    packet.Append16(kLegacySelector);
    packet.Append8(0);  // the length, known when the request is complete
    packet.Append8(0);
  } else {
    packet.Append8(settings.subsystem);
    packet.Append16(mode_id);
  }
}

void BeginHeader(Diag_FTM& phone) {
  BeginHeader(phone, static_cast<u16>(phone.state<Settings>().mode_id));
}

void BeginCommand(Diag_FTM& phone, u16 mode_id, HeaderForm form, u16 command) {
  BeginHeader(phone, mode_id);
  CDiagPacket& packet = phone.packet();
  packet.Append16(command);
  if (form == HeaderForm::kPlain) return;
  packet.Append16(form == HeaderForm::kExtended ? RequestDataLength(mode_id, command) : u16{0});
  packet.Append16(0);
}

u16 RequestDataLength(u16 mode_id, u16 command) {
  switch (mode_id) {
    case kModeIdEvdo:
      return LengthIn(kEvdoLengths, command);
    case kModeIdAgps:
      return LengthIn(kAgpsLengths, command);
    default:
      return 0;
  }
}

Reply Transmit(Diag_FTM& phone) {
  const Settings& settings = phone.state<Settings>();
  if (settings.command_code == kCommandCode59) return TransmitLegacy(phone);
  phone.packet().set_response_length(0);  // a request that the sequencer keeps has none
  if (settings.queue_mode != 0 && settings.sequencer != nullptr) {
    return Enqueue(phone, *settings.sequencer) ? ReplyKind::kExpected : ReplyKind::kNotSent;
  }
  Reply reply = ReplyKind::kNotSent;
  if (ProcessClientRequestPacket(phone, reply) == kLayerSent) return reply ? reply : ReplyKind::kExpected;
  return reply;
}

void FtmHeader::Begin(Diag_FTM& phone) const {
  BeginCommand(phone, static_cast<u16>(phone.state<Settings>().mode_id), HeaderForm::kPlain, command);
}

Reply FtmHeader::Transmit(Diag_FTM& phone, u32) const {
  return ftm::Transmit(phone);
}

}  // namespace kral::ftm
