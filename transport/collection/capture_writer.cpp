// What capture files are made of, where one ends and the next begins, and what is lost. Which packets are captured is
// the sorter's affair.
#include "transport/collection/capture_writer.h"

#include <algorithm>
#include <new>
#include <utility>

#include "base/little_endian.h"
#include "base/text_log.h"
#include "transport/collection/capture_blocks.h"
#include "transport/engine/bounded_queue.h"

namespace kral {
namespace {

constexpr char kFileTakesNoMore[] = "the file cannot be written any more";

// What is compressed is with the system at most so long, and a batch, after it came: small blocks hardly shrink.
constexpr std::chrono::seconds kBlockTime{1};

// Less is no clock that somebody has set, but one that wavers.
constexpr uint64_t kSetBack = 1'000'000;

// The first of records; nothing where it is cut.
std::span<const uint8_t> FirstRecord(std::span<const uint8_t> bytes) {
  if (bytes.size() < capture_record::kSize) return {};
  const size_t size = capture_record::kSize + *LoadLe<uint16_t>(bytes, capture_record::kLength);
  return bytes.size() < size ? std::span<const uint8_t>() : bytes.first(size);
}

uint64_t TimeOf(std::span<const uint8_t> record) {
  return *LoadLe<uint64_t>(record, capture_record::kMicroseconds);
}

// Of records that may be cut at the end.
uint64_t CountWholeRecords(std::span<const uint8_t> bytes) {
  uint64_t count = 0;
  for (auto record = FirstRecord(bytes); !record.empty(); record = FirstRecord(bytes)) {
    bytes = bytes.subspan(record.size());
    ++count;
  }
  return count;
}

}  // namespace

std::array<uint8_t, capture_head::kSize> CaptureHead(uint16_t version) {
  std::array<uint8_t, capture_head::kSize> head{};
  std::ranges::copy(capture_head::kMagic, head.begin());
  StoreLe(std::span<uint8_t>(head), capture_head::kVersion, version);
  StoreLe(std::span<uint8_t>(head), capture_head::kHeadSize, static_cast<uint16_t>(capture_head::kSize));
  return head;
}

std::array<uint8_t, capture_record::kSize> CaptureRecordHead(uint64_t microseconds, size_t length) {
  std::array<uint8_t, capture_record::kSize> head{};
  const auto length16 = static_cast<uint16_t>(length);
  StoreLe(std::span<uint8_t>(head), capture_record::kMicroseconds, microseconds);
  StoreLe(std::span<uint8_t>(head), capture_record::kLength, length16);
  StoreLe(std::span<uint8_t>(head), capture_record::kLengthComplement, static_cast<uint16_t>(~length16));
  return head;
}

void TimeSteps::Add(uint64_t microseconds) {
  latest_ = std::max(latest_, microseconds);
  back_ = std::max(back_, latest_ - microseconds);
}

uint32_t TimeSteps::mark() const {
  const uint64_t milliseconds = back_ / 1000 + (back_ % 1000 != 0 ? 1 : 0);
  return static_cast<uint32_t>(std::min<uint64_t>(milliseconds + 1, capture_head::kStepsUnknown));
}

CaptureWriter::~CaptureWriter() {
  Stop();
}

bool CaptureWriter::Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner, CaptureLayout layout) {
  // No other capture runs once the base asks for the file.
  const auto open_first = [&] {
    layout_ = layout;
    open_ = open;
    return open();
  };
  return BatchWriter::Start(open_first, std::move(owner));
}

bool CaptureWriter::OnBegin() {
  lost_before_ = lost();
  loss_told_ = false;
  failed_ = false;
  if (layout_.compressed) block_.reserve(capture_block::kMostRecords);
  return BeginFile();
}

bool CaptureWriter::BeginFile() {
  const auto head = CaptureHead(layout_.compressed ? capture_head::kBlocks : capture_head::kRecords);
  file_size_ = head.size();
  file_begin_ = 0;
  steps_ = {};
  return Write(head) == head.size();
}

void CaptureWriter::Append(std::span<const uint8_t> packet, uint64_t microseconds) {
  if (state() != CaptureState::kRunning || packet.size() < capture_record::kShortestPacket ||
      packet.size() > kMaximumPacket) {
    return;
  }
  if (Add(CaptureRecordHead(microseconds, packet.size()), packet) == Added::kNoRoom) Lose(1, "the disk is too slow");
}

bool CaptureWriter::Stop(uint32_t time_out_ms) {
  const Ended ended = End(time_out_ms);
  if (ended == Ended::kNotYet) {
    log_.WriteLine(kLogErr, "Capture file: %u packets still wait for the disk", static_cast<unsigned>(pending()));
  }
  return ended == Ended::kDone && lost() == lost_before_;
}

void CaptureWriter::OnBatch(const Batch& batch) {
  const std::span<const uint8_t> bytes(batch.bytes);
  Records run{bytes.first(0), 0};
  for (auto record = FirstRecord(bytes); !record.empty();) {
    if (BelongsToNextFile(record, run.bytes.size())) {
      Take(run);
      BeginNextFile();
      run = {record.first(0), 0};
    }
    if (file_begin_ == 0) file_begin_ = TimeOf(record);
    steps_.Add(TimeOf(record));
    run = {{run.bytes.data(), run.bytes.size() + record.size()}, run.count + 1};
    record = FirstRecord({record.data() + record.size(), bytes.data() + bytes.size()});
  }
  Take(run);
  if (!block_.empty() && std::chrono::steady_clock::now() - block_begin_ >= kBlockTime) WriteBlock();
}

// `before`: bytes of this file that are not in it yet. The size of a block is known once it is made.
bool CaptureWriter::BelongsToNextFile(std::span<const uint8_t> record, size_t before) const {
  if (failed_ || file_begin_ == 0 || (layout_.file_bytes == 0 && layout_.file_seconds == 0)) return false;
  const uint64_t time = TimeOf(record);
  if (time < steps_.latest() && steps_.latest() - time >= kSetBack) return true;
  if (layout_.file_seconds != 0 && time >= file_begin_ &&
      time - file_begin_ >= layout_.file_seconds * uint64_t{1'000'000}) {
    return true;
  }
  return !layout_.compressed && layout_.file_bytes != 0 && file_size_ + before + record.size() > layout_.file_bytes;
}

// A head that says nothing of times costs time only: a failure is none of the capture's.
void CaptureWriter::EndFile() {
  std::array<uint8_t, sizeof(uint32_t)> mark{};
  StoreLe(std::span<uint8_t>(mark), 0, steps_.mark());
  RewriteAt(capture_head::kStepsBack, mark);
}

void CaptureWriter::OnEnd() {
  WriteBlock();
  EndFile();
}

void CaptureWriter::BeginNextFile() {
  WriteBlock();
  if (!failed_) EndFile();
  failed_ = failed_ || !GoOnIn(open_) || !BeginFile();
}

void CaptureWriter::Take(const Records& records) {
  if (!layout_.compressed) return WriteRecords(records);
  auto rest = records.bytes;
  for (auto record = FirstRecord(rest); !record.empty(); record = FirstRecord(rest)) {
    if (block_.size() + record.size() > capture_block::kMostRecords) WriteBlock();
    if (block_.empty()) block_begin_ = std::chrono::steady_clock::now();
    block_.insert(block_.end(), record.begin(), record.end());
    rest = rest.subspan(record.size());
    in_block_.fetch_add(1, std::memory_order_relaxed);
  }
}

void CaptureWriter::WriteBlock() {
  if (block_.empty()) return;
  const uint64_t count = in_block_.load(std::memory_order_relaxed);
  std::vector<uint8_t> block;
  try {
    block = MakeCaptureBlock(block_);
  } catch (const std::bad_alloc&) {
    block_.clear();
    Lose(count, "out of memory");
    in_block_.store(0, std::memory_order_relaxed);
    return;
  }
  const bool has_blocks = file_size_ > capture_head::kSize;
  if (!failed_ && has_blocks && layout_.file_bytes != 0 && file_size_ + block.size() > layout_.file_bytes) {
    const TimeSteps steps = steps_;  // of this block too: what it adds makes no step smaller than it is
    EndFile();
    failed_ = !GoOnIn(open_) || !BeginFile();
    file_begin_ = TimeOf(block_);
    steps_ = steps;
  }
  failed_ = failed_ || Write(block) < block.size();
  file_size_ += block.size();
  block_.clear();
  if (!failed_) written_.fetch_add(count, std::memory_order_relaxed);
  if (failed_) Lose(count, kFileTakesNoMore);
  in_block_.store(0, std::memory_order_relaxed);
}

// Behind a record that is cut nothing more can be read: a file that took no more stays as it is.
void CaptureWriter::WriteRecords(const Records& records) {
  const size_t taken = failed_ ? 0 : Write(records.bytes);
  file_size_ += taken;
  failed_ = failed_ || taken < records.bytes.size();
  const uint64_t whole = failed_ ? CountWholeRecords(records.bytes.first(taken)) : records.count;
  written_.fetch_add(whole, std::memory_order_relaxed);
  if (whole < records.count) Lose(records.count - whole, kFileTakesNoMore);
}

void CaptureWriter::Lose(uint64_t packets, const char* reason) {
  lost_.fetch_add(packets, std::memory_order_relaxed);
  if (!loss_told_.exchange(true)) log_.WriteLine(kLogErr, "Capture file: packets are lost, %s", reason);
}

}  // namespace kral
