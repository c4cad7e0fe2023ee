// Records become blocks of a pcapng file; the file's outcome is counted record by record.
#include <new>
#include <utility>

#include "transport/line/hdlc_frame.h"
#include "transport/trace/pcapng_blocks.h"
#include "transport/trace/pcapng_format.h"
#include "transport/trace/trace_writer.h"

namespace kral {
namespace {

// In the order of their blocks.
constexpr uint32_t kFrameInterface = 0;
constexpr uint32_t kByteInterface = 1;

bool IsFrame(TrafficRecord::Kind kind) {
  return kind == TrafficRecord::Kind::kFrame || kind == TrafficRecord::Kind::kBadFrame;
}

}  // namespace

bool TraceFile::Begin(const TraceOrigin& origin, const Write& write) {
  splitter_.Reset();
  buffer_.clear();
  done_.clear();
  outcome_ = {};
  cut_told_ = 0;
  received_ = {};
  failed_ = false;
  pcapng::AppendSection(buffer_, origin.application);
  pcapng::AppendInterface(buffer_, pcapng::interface::kFrames, {origin.port, origin.description});
  pcapng::AppendInterface(buffer_, pcapng::interface::kBytes,
                          {origin.port + " bytes", origin.description + ", what is in no frame"});
  WriteOut(write);
  return !failed_;
}

void TraceFile::Take(std::span<const uint8_t> pieces, const Write& write) {
  for (TrafficPiece piece; piece.Take(pieces);) {
    try {
      splitter_.Take(piece);
    } catch (const std::bad_alloc&) {
      outcome_.unmade += splitter_.Lose(piece);
    }
  }
  WriteOut(write);
}

void TraceFile::End(uint64_t microseconds, uint64_t lost_before, const Write& write) {
  splitter_.Finish(microseconds);
  WriteOut(write);
  AppendStatistics(microseconds, lost_before + outcome_.unwritten + outcome_.unmade + splitter_.cut() - cut_told_);
  WriteOut(write);
}

void TraceFile::AppendStatistics(uint64_t microseconds, uint64_t lost) {
  try {
    pcapng::AppendStatistics(buffer_, kFrameInterface, microseconds, received_[kFrameInterface] + lost, lost);
    pcapng::AppendStatistics(buffer_, kByteInterface, microseconds, received_[kByteInterface], 0);
  } catch (const std::bad_alloc&) {
    buffer_.clear();  // a trace can be read without them
  }
}

TraceFile::Outcome TraceFile::TakeOutcome() {
  outcome_.cut = splitter_.cut() - cut_told_;
  cut_told_ = splitter_.cut();
  return std::exchange(outcome_, {});
}

// Whole, or not at all.
void TraceFile::Append(const TrafficRecord& record) {
  const size_t before = buffer_.size();
  try {
    AppendBlock(record);
    done_.push_back({buffer_.size(), record.kind});
  } catch (const std::bad_alloc&) {
    buffer_.resize(before);
    ++outcome_.unmade;
  }
}

void TraceFile::AppendBlock(const TrafficRecord& record) {
  const bool is_frame = IsFrame(record.kind);
  pcapng::PacketBlock block;
  block.interface = is_frame ? kFrameInterface : kByteInterface;
  block.microseconds = record.microseconds;
  block.flags = record.direction == PortDirection::kSent ? pcapng::flags::kOutbound : pcapng::flags::kInbound;
  if (is_frame) block.flags |= static_cast<uint32_t>(kFcsSize) << pcapng::flags::kFcsLengthShift;
  if (record.kind == TrafficRecord::Kind::kBadFrame) block.flags |= pcapng::flags::kBadFcs;
  block.comment = record.comment;
  block.data = record.bytes;
  pcapng::AppendPacket(buffer_, block);
}

// Behind a block that is cut nothing more can be read: a file that took no more stays as it is.
void TraceFile::WriteOut(const Write& write) {
  const size_t taken = failed_ || buffer_.empty() ? 0 : write(buffer_);
  failed_ = failed_ || taken < buffer_.size();
  for (const Done& record : done_) {
    if (record.end > taken) {
      ++outcome_.unwritten;
    } else if (IsFrame(record.kind)) {
      ++outcome_.frames;
      if (record.kind == TrafficRecord::Kind::kBadFrame) ++outcome_.bad;
      ++received_[kFrameInterface];
    } else {
      ++outcome_.others;
      ++received_[kByteInterface];
    }
  }
  buffer_.clear();
  done_.clear();
}

}  // namespace kral
