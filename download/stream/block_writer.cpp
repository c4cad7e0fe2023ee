// The loop that keeps the window full. What is outstanding and what comes next is the agent's to tell.
#include "download/stream/block_writer.h"

#include <algorithm>

#include "base/failure.h"
#include "download/stream/stream_format.h"

namespace kral::stream {
namespace {

// Then nobody is there any more.
constexpr uint32_t kMostTimeOutsInARow = 10;
// How often a wait looks for an abort.
constexpr uint32_t kSliceMs = 20;
constexpr uint32_t kProgressLineEvery = 0x80000;  // addresses

Failure NotAcknowledged(const std::optional<DownloadAgent::OtherReply>& reply, uint32_t acknowledged) {
  if (!reply) {
    return Failure(KRAL_ERROR_LOST, "the handset went away when it had acknowledged %u bytes", acknowledged)
        .Offset(acknowledged);
  }
  return Failure(KRAL_ERROR_LINK, "a write was answered with %zu bytes of code %d instead of an acknowledgement",
                 reply->size, reply->code)
      .Status(KRAL_ERROR_STATUS_REPLY, reply->code)
      .Offset(acknowledged);
}

}  // namespace

BlockWriter::BlockWriter(download::DownloadConnection& connection, DownloadAgent& agent,
                         const images::PhoneImage& image, CImageWriteCmd& command, uint32_t block_size,
                         uint32_t time_out_ms)
    : connection_(connection),
      agent_(agent),
      image_(image),
      command_(command),
      time_out_ms_(time_out_ms),
      most_data_(std::min(block_size, CImageWriteCmdFramed::kMostFramedData)),
      buffer_(kWriteHeaderSize + 2 * size_t{most_data_}) {}

bool BlockWriter::Run(uint32_t total) {
  while (!agent_.done()) {
    std::optional<CDownloadBlock> block;
    switch (AwaitTurn(total)) {
      case Turn::kGiveUp:
        return false;
      case Turn::kNothing:
        continue;
      case Turn::kSendAgain:
        block = Load(agent_.Newest());
        break;
      case Turn::kTake:
        block = Take();
        break;
    }
    if (!block) {
      // The last acknowledgement may have come between the wait and the look.
      if (agent_.done() || !agent_.head()) continue;
      return false;
    }
    if (!Send(*block)) return false;
  }
  connection_.Report(agent_.bytes_acknowledged(), total);
  return true;
}

BlockWriter::Turn BlockWriter::AwaitTurn(uint32_t total) {
  CWaitableTimer timer;
  timer.Arm(time_out_ms_);
  for (;;) {
    const auto wait = agent_.AwaitTurn(std::min(kSliceMs, time_out_ms_));
    const uint32_t acknowledged = agent_.bytes_acknowledged();
    if (acknowledged != acknowledged_) time_outs_in_a_row_ = 0;
    acknowledged_ = acknowledged;
    connection_.Report(acknowledged, total);
    if (connection_.aborted()) return Turn::kGiveUp;
    if (wait == DownloadAgent::Wait::kFailed) {
      Fail(NotAcknowledged(agent_.other_reply(), acknowledged));
      return Turn::kGiveUp;
    }
    if (wait == DownloadAgent::Wait::kReady) return Turn::kTake;
    if (agent_.done()) return Turn::kNothing;
    if (!timer.expired()) continue;
    if (++time_outs_in_a_row_ < kMostTimeOutsInARow) return Turn::kSendAgain;
    Fail(Failure(KRAL_ERROR_LOST, "the handset acknowledges nothing any more: %u of %u bytes are in flash",
                 acknowledged, total)
             .Offset(acknowledged));
    return Turn::kGiveUp;
  }
}

// What was skipped goes out again before anything new.
std::optional<CDownloadBlock> BlockWriter::Take() {
  const auto block = Load(agent_.TakeResend());
  return block ? block : Carve();
}

std::optional<CDownloadBlock> BlockWriter::Load(std::optional<CDownloadBlock> block) {
  if (block) Hold(*block);
  return block;
}

std::span<const uint8_t> BlockWriter::Hold(const CDownloadBlock& block) {
  if (held_.address != block.address || held_.device != block.device || held_.size == 0) {
    held_ = {block.address, 0, block.device};
    held_begin_ = kWriteHeaderSize;
  }
  if (held_begin_ + block.size > buffer_.size()) {
    std::copy_n(buffer_.data() + held_begin_, held_.size, buffer_.data() + kWriteHeaderSize);
    held_begin_ = kWriteHeaderSize;
  }
  uint8_t* const begin = buffer_.data() + held_begin_;
  if (held_.size < block.size) {
    image_.Read(block.address + held_.size, begin + held_.size, block.size - held_.size, block.device);
    held_.size = block.size;
  }
  return {begin, block.size};
}

std::optional<CDownloadBlock> BlockWriter::Carve() {
  const auto head = agent_.head();
  if (!head) return std::nullopt;
  const auto data = Hold({head->address, std::min(head->size, most_data_), head->device});
  return agent_.Carve(CImageWriteCmdFramed::FittingSize(head->address, data));
}

bool BlockWriter::Send(const CDownloadBlock& block) {
  const auto packet = std::span(buffer_).subspan(held_begin_ - kWriteHeaderSize, kWriteHeaderSize + block.size);
  if (!command_.Send(block.address, packet)) return false;
  held_ = {block.address + block.size, held_.size - block.size, block.device};
  held_begin_ += block.size;
  agent_.CountSent();
  if (block.address % kProgressLineEvery == 0) {
    connection_.log().WriteLine(kLogRet, "Streaming address 0x%08X, acknowledged 0x%X\n", block.address,
                                agent_.bytes_acknowledged());
  }
  return true;
}

}  // namespace kral::stream
