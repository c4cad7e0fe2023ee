// Gathers packets in memory and writes them in large pieces. Which packets are captured is the sorter's affair.
#include "transport/collection/capture_writer.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <thread>
#include <utility>

#include "base/at_exit.h"
#include "base/little_endian.h"
#include "base/text_log.h"
#include "platform/file_util.h"
#include "transport/collection/capture_format.h"
#include "transport/engine/bounded_queue.h"

namespace kral {
namespace {

// A packet is with the system at most so long after it came, or as soon as there is a good piece to write.
constexpr std::chrono::milliseconds kGatherTime{100};
constexpr size_t kGoodPiece = size_t{64} << 10;
constexpr size_t kBehind = 4 * kGoodPiece;
constexpr size_t kSlice = size_t{16} << 10;  // what the system copies in a few microseconds

uint64_t MicrosecondsNow() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
}

std::array<uint8_t, capture_head::kSize> MakeHead() {
  std::array<uint8_t, capture_head::kSize> head{};
  std::ranges::copy(capture_head::kMagic, head.begin());
  StoreLe(std::span<uint8_t>(head), capture_head::kVersion, capture_head::kThisVersion);
  StoreLe(std::span<uint8_t>(head), capture_head::kHeadSize, static_cast<uint16_t>(capture_head::kSize));
  return head;
}

std::array<uint8_t, capture_record::kSize> MakeRecordHead(size_t length) {
  std::array<uint8_t, capture_record::kSize> head{};
  const auto length16 = static_cast<uint16_t>(length);
  StoreLe(std::span<uint8_t>(head), capture_record::kMicroseconds, MicrosecondsNow());
  StoreLe(std::span<uint8_t>(head), capture_record::kLength, length16);
  StoreLe(std::span<uint8_t>(head), capture_record::kLengthComplement, static_cast<uint16_t>(~length16));
  return head;
}

// Of records that may be cut at the end.
uint64_t CountWholeRecords(std::span<const uint8_t> bytes) {
  uint64_t count = 0;
  while (bytes.size() >= capture_record::kSize) {
    const size_t size = capture_record::kSize + *LoadLe<uint16_t>(bytes, capture_record::kLength);
    if (bytes.size() < size) break;
    bytes = bytes.subspan(size);
    ++count;
  }
  return count;
}

}  // namespace

CaptureSink OpenCaptureFile(const std::string& path) {
  const std::shared_ptr<std::FILE> file(OpenToWrite(path), [](std::FILE* opened) {
    if (opened != nullptr) CloseStream(opened);
  });
  if (!file) return {};
  // Pieces are large already; without a buffer the result tells what the system has taken.
  std::setvbuf(file.get(), nullptr, _IONBF, 0);
  return [file](std::span<const uint8_t> bytes) { return std::fwrite(bytes.data(), 1, bytes.size(), file.get()); };
}

CaptureWriter::~CaptureWriter() {
  Stop();
}

bool CaptureWriter::Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner) {
  const MutexLock control(control_mutex_);
  if (state_ == CaptureState::kRunning || (state_ == CaptureState::kEnding && !ended_.WaitFor(0))) return false;
  thread_.Join();
  state_ = CaptureState::kNone;
  CaptureSink sink = open();
  const auto head = MakeHead();
  if (!sink || sink(head) != head.size()) return false;
  {
    const MutexLock lock(mutex_);
    stop_requested_ = false;
  }
  sink_ = std::move(sink);
  lost_before_ = lost();
  loss_told_ = false;
  ended_.Reset();
  if (!thread_.Start([this] { Run(); }, std::move(owner))) {
    sink_ = {};
    return false;
  }
  state_ = CaptureState::kRunning;
  return true;
}

void CaptureWriter::Append(std::span<const uint8_t> packet) {
  if (state() != CaptureState::kRunning || packet.size() < capture_record::kShortestPacket ||
      packet.size() > kMaximumPacket) {
    return;
  }
  const auto head = MakeRecordHead(packet.size());
  bool kept = false;
  bool wake = false;
  {
    const MutexLock lock(mutex_);
    if (stop_requested_) return;  // it came after the end
    std::vector<uint8_t>& records = pending_.records;
    const size_t before = records.size();
    const size_t after = before + head.size() + packet.size();
    if (after <= room_) {
      try {
        if (after > records.capacity()) records.reserve(std::min(2 * after, room_));
        records.insert(records.end(), head.begin(), head.end());
        records.insert(records.end(), packet.begin(), packet.end());
        ++pending_.packets;
        pending_packets_.fetch_add(1, std::memory_order_relaxed);
        kept = true;
        wake = before < kGoodPiece && after >= kGoodPiece;
      } catch (...) {
        // Out of memory: lost like a packet that the disk is too slow for.
      }
    }
  }
  if (wake) changed_.NotifyOne();
  if (!kept) Lose(1, "the disk is too slow");
}

bool CaptureWriter::Stop(uint32_t time_out_ms) {
  const MutexLock control(control_mutex_);
  if (state_ == CaptureState::kNone) return false;
  state_ = CaptureState::kEnding;
  {
    const MutexLock lock(mutex_);
    stop_requested_ = true;
    changed_.NotifyOne();
  }
  if (!ended_.WaitFor(time_out_ms)) {
    log_.WriteLine(kLogErr, "Capture file: %u packets still wait for the disk", static_cast<unsigned>(pending()));
    return false;
  }
  thread_.Join();
  state_ = CaptureState::kNone;
  return lost() == lost_before_;
}

void CaptureWriter::Run() {
  const AtExit ended([this] {
    sink_ = {};
    ended_.Set();
  });
  Batch batch;
  bool failed = false;
  while (TakeBatch(batch)) WriteBatch(batch, failed);
}

// Looks by itself whether anything came: to be woken by the first packet of each batch would hold the connection up
// more than the looks cost. False at the end.
bool CaptureWriter::TakeBatch(Batch& batch) {
  batch.records.clear();
  batch.packets = 0;
  MutexLock lock(mutex_);
  changed_.WaitFor(lock, kGatherTime,
                   [this]() KRAL_REQUIRES(mutex_) { return stop_requested_ || pending_.records.size() >= kGoodPiece; });
  std::swap(batch, pending_);
  return batch.packets != 0 || !stop_requested_;
}

// Behind a record that is cut nothing more can be read: a file that took no more stays as it is.
void CaptureWriter::WriteBatch(const Batch& batch, bool& failed) {
  const std::span<const uint8_t> records(batch.records);
  const size_t taken = failed ? 0 : WriteInSlices(records);
  failed = failed || taken < records.size();
  const uint64_t whole = failed ? CountWholeRecords(records.first(taken)) : batch.packets;
  written_.fetch_add(whole, std::memory_order_relaxed);
  if (whole < batch.packets) Lose(batch.packets - whole, "the file cannot be written any more");
  pending_packets_.fetch_sub(batch.packets, std::memory_order_relaxed);
}

// After each slice whoever waits for this processor may have it: on a machine of few, that may be the answer to a
// command. A writer that has fallen behind gives nothing away.
size_t CaptureWriter::WriteInSlices(std::span<const uint8_t> bytes) {
  const size_t most = bytes.size() > kBehind ? bytes.size() : kSlice;
  size_t taken = 0;
  while (taken < bytes.size()) {
    const auto slice = bytes.subspan(taken, std::min(most, bytes.size() - taken));
    const size_t count = std::min(sink_(slice), slice.size());
    taken += count;
    if (count < slice.size()) break;
    std::this_thread::yield();
  }
  return taken;
}

void CaptureWriter::Lose(uint64_t packets, const char* reason) {
  lost_.fetch_add(packets, std::memory_order_relaxed);
  if (!loss_told_.exchange(true)) log_.WriteLine(kLogErr, "Capture file: packets are lost, %s", reason);
}

}  // namespace kral
