// Requests over a connection: sent, and answered or timed out; and the changes of packet mode, which begin with a
// request. The connection itself is kral_thread_interface.cpp's.
#include <algorithm>
#include <array>
#include <chrono>

#include "base/text_log.h"
#include "transport/engine/kral_events.h"
#include "transport/engine/kral_thread_interface.h"

namespace kral {
namespace {

// A bound for what takes microseconds, unless a listener or a log callback holds the threads up.
constexpr uint32_t kSettleMs = 20;

// A caller that tells of bytes may have missed some: while they are awaited its transport is looked at all the same.
constexpr uint32_t kLookEveryMs = 20;
// For the answer that may be on its way when its request is aborted.
constexpr std::chrono::milliseconds kMomentBehindAbort{80};

bool IsUnframed(PacketMode mode) {
  return mode == PacketMode::kUnframed1 || mode == PacketMode::kUnframed2;
}

bool BeginsWithAt(std::span<const uint8_t> request) {
  return request.size() >= 2 && request[0] == 'A' && request[1] == 'T';
}

// What of a record the room takes, less the FCS bytes at the record's end.
std::span<const uint8_t> WithoutFcs(const Packet& record) {
  return std::span(record).first(record.size() > kFcsSize ? record.size() - kFcsSize : 0);
}

std::span<const uint8_t> CopyRecord(const Packet& record, std::span<uint8_t> room) {
  const size_t count = std::min(record.size(), room.size());
  std::copy_n(record.begin(), count, room.begin());
  return room.first(std::min(WithoutFcs(record).size(), count));
}

}  // namespace

Reply CKralThreadInterface::SendSync(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                                     uint32_t time_out_ms, uint32_t delay_ms, const ReplyTest& is_own) {
  if (responses_ == nullptr) return ReplyKind::kNotSent;
  log_.WriteBytes(kLogIo, "SEND (%d bytes):%s", request);
  ForgetReplies();
  const uint32_t start = clock_.TickMs();
  if (null_port_) {
    log_.WriteLine(kLogErr, "Send Sync skipped for NULL port");
    return ReplyKind::kNullPort;
  }

  Reply reply;
  if (Transmit(request, time_out_ms)) {
    LogWritten(time_out_ms, start);
    if (delay_ms != 0) clock_.SleepMs(delay_ms);
    const uint32_t read_start = clock_.TickMs();
    aborted_at_.reset();
    reply = AwaitNext(room, expected_code, time_out_ms, is_own);
    const bool has_time = reply.came() && (reply || clock_.TickMs() - read_start <= time_out_ms);
    if (reply.kind() == ReplyKind::kGone) {
      log_.WriteLine(kLogErr, "Request not answered: the device has gone");
      Close();
    } else if (!has_time && reply.kind() != ReplyKind::kAborted) {
      TimedOut(request);
    }
    if (reply) {
      log_.WriteLine(kLogRet, "READ STACK TIME (ms):\t%d", static_cast<int>(clock_.TickMs() - read_start));
    } else {
      log_.WriteLine(kLogErr, "Error. Send Sync Read failed.");
    }
  } else {
    reply = WhyNotWritten();
  }
  log_.WriteLine(kLogRet, "CKralThreadInterface::SendSync = result = %d", reply ? 1 : 0);
  return reply;
}

// Only replies to the request that follows shall count. What has been read already answers an earlier one: it is let
// through to the queue before that is cleared, or a reply that came twice would fail the next request.
void CKralThreadInterface::ForgetReplies() {
  loop_.ReadWaiting();
  loop_.WaitForChunk(kSettleMs);
  if (feed_.dispatcher != nullptr) feed_.dispatcher->WaitUntilDispatched(kSettleMs);
  for (const Packet& record : responses_->TakeAll()) {
    if (unclaimed_) unclaimed_(WithoutFcs(record));
  }
  garbled_before_ = splitter_.deframer().bad_fcs();
}

Reply CKralThreadInterface::AwaitNext(std::span<uint8_t> room, uint8_t expected_code, uint32_t time_out_ms,
                                      const ReplyTest& is_own) {
  const uint32_t start = clock_.TickMs();
  for (uint32_t waited = 0;; waited = clock_.TickMs() - start) {
    if (waited > 0 && waited >= time_out_ms) return WhyNoReply();  // nothing but earlier replies
    if (IsMomentBehindAbortOver()) return WhyNoReply();
    const auto record = AwaitRecord(std::chrono::milliseconds(time_out_ms - waited));
    if (!record || record->empty()) return WhyNoReply();
    const auto bytes = CopyRecord(*record, room);
    const bool expected = record->front() == expected_code;
    if (expected && (!is_own || is_own(bytes))) return {ReplyKind::kExpected, expected_code, bytes};
    if (unclaimed_) unclaimed_(WithoutFcs(*record));
    if (!expected) {
      // The first other reply ends the request: the handset answers in order, so what was asked for will not come.
      log_.WriteLine(kLogErr, "Received different response command byte (0x%X)than was requested (0x%X)",
                     record->front(), expected_code);
      return {ReplyKind::kOther, record->front(), bytes};
    }
    log_.WriteLine(kLogErr, "Received reply (0x%X) to an earlier request", expected_code);
  }
}

// A handset that goes on telling other things does not make the abort wait, however often these are asked for.
bool CKralThreadInterface::IsMomentBehindAbortOver() {
  if (!aborted()) return false;
  if (!aborted_at_) aborted_at_ = clock_.TickMs();
  return std::chrono::milliseconds(clock_.TickMs() - *aborted_at_) >= kMomentBehindAbort;
}

std::optional<Packet> CKralThreadInterface::AwaitRecord(std::chrono::milliseconds time_out) {
  auto record = PopWithin(time_out);
  if (!record && aborted()) record = responses_->PopWithin(std::min(time_out, kMomentBehindAbort));
  return record;
}

std::optional<Packet> CKralThreadInterface::PopWithin(std::chrono::milliseconds time_out) {
  using std::chrono::steady_clock;
  const auto end = steady_clock::now() + time_out;
  auto left = time_out;
  while (user_defined_ && loop_.caller_notifies() && left.count() > kLookEveryMs) {
    auto record = responses_->PopWithin(std::chrono::milliseconds(kLookEveryMs), abort_);
    if (record || responses_->closed() || aborted()) return record;
    control_.Notify();
    left = std::chrono::ceil<std::chrono::milliseconds>(end - steady_clock::now());
  }
  loop_.ReadHere(left, [this] { return responses_->size() > 0 || responses_->closed() || aborted(); });
  left = std::chrono::ceil<std::chrono::milliseconds>(end - steady_clock::now());
  return responses_->PopWithin(std::max(left, std::chrono::milliseconds(0)), abort_);
}

ReplyKind CKralThreadInterface::WhyNotWritten() const {
  if (!port_.gone()) return ReplyKind::kWriteFailed;
  return port_.may_have_sent() ? ReplyKind::kGone : ReplyKind::kGoneUnsent;
}

ReplyKind CKralThreadInterface::WhyNoReply() const {
  if (port_.gone()) return ReplyKind::kGone;
  if (aborted()) return ReplyKind::kAborted;
  return splitter_.deframer().bad_fcs() != garbled_before_ ? ReplyKind::kGarbled : ReplyKind::kNone;
}

// A handset that does not answer is given up: the next request finds the port closed and opens it afresh.
void CKralThreadInterface::TimedOut(std::span<const uint8_t> request) {
  timed_out_request_.assign(request.begin(), request.end());
  log_.WriteLine(kLogErr, "Request timed out");
  Close();
  // A caller's transport stays open: what broke off belongs to what has ended all the same.
  DropPartial();
}

Reply CKralThreadInterface::SendRaw(std::span<const uint8_t> request, std::span<uint8_t> room, uint32_t time_out_ms) {
  if (responses_ == nullptr) return ReplyKind::kNotSent;
  log_.WriteBytes(kLogIo, "SEND RAW (%d bytes):%s", request);
  ForgetReplies();
  const uint32_t start = clock_.TickMs();
  if (null_port_) {
    log_.WriteLine(kLogErr, "Send Sync skipped for NULL port");
    return ReplyKind::kNullPort;
  }

  if (IsUnframed(packet_mode()) && BeginsWithAt(request)) splitter_.SetAtReplyMode(true);
  Reply reply;
  if (Transmit(request, time_out_ms)) {
    LogWritten(time_out_ms, start);
    reply = PollRecord(room, time_out_ms);
    if (!reply) log_.WriteLine(kLogErr, "Error. Read failed.");
  } else {
    reply = WhyNotWritten();
  }
  splitter_.SetAtReplyMode(false);
  return reply;
}

Reply CKralThreadInterface::PollRecord(std::span<uint8_t> room, uint32_t time_out_ms) {
  loop_.TakeBack();
  const uint32_t start = clock_.TickMs();
  for (uint32_t turn = 1;; ++turn) {
    const bool ended = responses_->closed();
    if (const auto record = responses_->Pop()) {
      const size_t count = std::min(record->size(), room.size());
      std::copy_n(record->begin(), count, room.begin());
      log_.WriteLine(kLogRet, "READ STACK TIME (ms):\t%d", static_cast<int>(clock_.TickMs() - start));
      return {ReplyKind::kExpected, record->empty() ? uint8_t{0} : record->front(), room.first(count)};
    }
    if (clock_.TickMs() - start >= time_out_ms || ended) return WhyNoReply();
    if (user_defined_ && turn % kLookEveryMs == 0) control_.Notify();
    clock_.SleepMs(1);
  }
}

Reply CKralThreadInterface::SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag) {
  log_.WriteBytes(kLogIo, "SEND_ASYNC (%d bytes):%s", request);
  if (null_port_) {
    log_.WriteLine(kLogErr, "Send Sync skipped for NULL port");
    return ReplyKind::kNullPort;
  }
  loop_.TakeBack();  // what comes of it is not awaited here
  const uint32_t start = clock_.TickMs();
  const auto size = static_cast<uint32_t>(request.size());
  if (framer_.Send(request.data(), size, time_out_ms, start_flag ? 1 : 0) != 1) {
    log_.WriteLine(kLogErr, "Error. Send data failed.");
    return WhyNotWritten();
  }
  LogWritten(time_out_ms, start);
  return ReplyKind::kExpected;
}

bool CKralThreadInterface::Transmit(std::span<const uint8_t> request, uint32_t time_out_ms) {
  if (framer_.Send(request.data(), static_cast<uint32_t>(request.size()), time_out_ms, 0) == 1) return true;
  log_.WriteLine(kLogErr, "Error. Send data failed.");
  Close();
  return false;
}

Reply CKralThreadInterface::SetPacketMode(uint32_t mode) {
  if (mode > static_cast<uint32_t>(PacketMode::kLengthPrefixed)) {
    log_.WriteLine(kLogErr, "KRAL_SetPacketMode() -  Error, Invalid packet mode");
    return ReplyKind::kNotSent;
  }
  if (NeedsPhoneFor(mode)) {
    const Reply reply = mode == 0 ? ReturnToFramedMode() : AskForUnframedMode();
    if (!reply) return reply;
  }
  framer_.SetRawDataFlag(mode);
  splitter_.SetMode(static_cast<PacketMode>(mode));
  TellContent();
  log_.WriteLine(kLogRet, "RAW_DATA_FLAG = %s", mode != 0 ? "ON" : "OFF");
  return ReplyKind::kExpected;
}

// Only between the framed and the first unframed mode.
bool CKralThreadInterface::NeedsPhoneFor(uint32_t mode) const {
  const auto from = packet_mode();
  const auto to = static_cast<PacketMode>(mode);
  return (from == PacketMode::kFramed && to == PacketMode::kUnframed1) ||
         (from == PacketMode::kUnframed1 && to == PacketMode::kFramed);
}

Reply CKralThreadInterface::AskForUnframedMode() {
  std::array<uint8_t, kMaximumPacket> room;
  const Reply reply = SendSync(kUnframedModeRequest, room, kUnframedModeRequest[0], kUnframedModeMs, 0);
  const bool agreed = reply.bytes().size() >= 2 && reply.bytes()[1] == 1;
  return {reply && !agreed ? ReplyKind::kOther : reply.kind(), reply.code(), {}};
}

// The framer reads the handset's answer itself, so the receive thread must not.
Reply CKralThreadInterface::ReturnToFramedMode() {
  const bool was_paused = paused_;
  if (!PauseThread()) {
    ResumeThread();
    return ReplyKind::kNotSent;
  }
  const bool switched = framer_.Data2DM(CProtAHDLC::kTry115200) == 1;
  if (!was_paused) ResumeThread();
  return switched ? ReplyKind::kExpected : ReplyKind::kNone;
}

bool CKralThreadInterface::FlushRxBuffer() {
  if (!connected()) return false;
  // The purge's own result tells nothing: a caller's transport reports 0 for every flush it made.
  if (!null_port_) port_.FlushPCBuffer();
  loop_.WaitForChunk(kSettleMs);
  DropPartial();
  return true;
}

uint32_t CKralThreadInterface::QueryState(uint32_t) const {
  return 0;
}

void CKralThreadInterface::LogWritten(uint32_t time_out_ms, uint32_t start) {
  log_.WriteLine(kLogRet, "OK\t Timeout=%d", static_cast<int>(time_out_ms));
  log_.WriteLine(kLogRet, "WRITE STACK TIME (ms):\t%d", static_cast<int>(clock_.TickMs() - start));
}

}  // namespace kral
