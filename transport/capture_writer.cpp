// Gathers packets in memory and writes them in large pieces. Which packets are captured is the sorter's affair.
#include "transport/capture_writer.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <utility>

#include "frame/base/little_endian.h"
#include "frame/base/text_log.h"
#include "transport/bounded_queue.h"
#include "transport/capture_format.h"

namespace kral {
namespace {

// A packet is with the system at most so long after it came, or as soon as there is a good piece to write.
constexpr std::chrono::milliseconds kGatherTime{100};
constexpr size_t kGoodPiece = size_t{64} << 10;

uint64_t MicrosecondsNow() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
}

std::array<uint8_t, capture_head::kSize> MakeHead() {
  std::array<uint8_t, capture_head::kSize> head{};
  std::copy(capture_head::kMagic.begin(), capture_head::kMagic.end(), head.begin());
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

}  // namespace

CaptureSink OpenCaptureFile(const std::string& path) {
  const std::shared_ptr<std::FILE> file(std::fopen(path.c_str(), "wb"), [](std::FILE* opened) {
    if (opened != nullptr) std::fclose(opened);
  });
  if (!file) return {};
  return [file](std::span<const uint8_t> bytes) {
    return std::fwrite(bytes.data(), 1, bytes.size(), file.get()) == bytes.size() && std::fflush(file.get()) == 0;
  };
}

CaptureWriter::~CaptureWriter() {
  Stop();
}

bool CaptureWriter::Start(CaptureSink sink, std::shared_ptr<void> owner) {
  const std::lock_guard control(control_mutex_);
  if (!sink || active_ || thread_.running() || !sink(MakeHead())) return false;
  thread_.Join();
  {
    const std::lock_guard lock(mutex_);
    pending_.clear();
    pending_packets_ = 0;
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
  active_ = true;
  return true;
}

void CaptureWriter::Append(std::span<const uint8_t> packet) {
  if (!active() || packet.size() < capture_record::kShortestPacket || packet.size() > kMaximumPacket) return;
  const auto head = MakeRecordHead(packet.size());
  bool kept = false;
  bool wake = false;
  {
    const std::lock_guard lock(mutex_);
    if (stop_requested_) return;  // it came after the end
    const size_t before = pending_.size();
    const size_t after = before + head.size() + packet.size();
    if (after <= room_) {
      try {
        pending_.resize(after);
        const auto record = pending_.begin() + static_cast<std::ptrdiff_t>(before);
        std::copy(packet.begin(), packet.end(), std::copy(head.begin(), head.end(), record));
        ++pending_packets_;
        kept = true;
        wake = before == 0 || (before < kGoodPiece && after >= kGoodPiece);
      } catch (...) {
        // Out of memory: lost like a packet that the disk is too slow for.
      }
    }
  }
  if (wake) changed_.notify_one();
  if (!kept) Lose(1, "the disk is too slow");
}

bool CaptureWriter::Stop(uint32_t time_out_ms) {
  const std::lock_guard control(control_mutex_);
  active_ = false;
  if (thread_.running()) {
    {
      const std::lock_guard lock(mutex_);
      stop_requested_ = true;
      changed_.notify_one();
    }
    if (!ended_.WaitFor(time_out_ms)) return false;
  }
  thread_.Join();
  return lost() == lost_before_;
}

void CaptureWriter::Run() {
  std::vector<uint8_t> batch;
  uint64_t packets = 0;
  bool failed = false;
  while (TakeBatch(batch, packets)) {
    // Behind a record that is cut nothing more can be read: a file that took no more stays as it is.
    failed = failed || !sink_(batch);
    if (failed) {
      Lose(packets, "the file cannot be written any more");
    } else {
      written_.fetch_add(packets, std::memory_order_relaxed);
    }
  }
  sink_ = {};
  ended_.Set();
}

bool CaptureWriter::TakeBatch(std::vector<uint8_t>& batch, uint64_t& packets) {
  batch.clear();
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [this] { return stop_requested_ || !pending_.empty(); });
  changed_.wait_for(lock, kGatherTime, [this] { return stop_requested_ || pending_.size() >= kGoodPiece; });
  if (pending_.empty()) return false;
  batch.swap(pending_);
  packets = std::exchange(pending_packets_, 0);
  return true;
}

void CaptureWriter::Lose(uint64_t packets, const char* reason) {
  lost_.fetch_add(packets, std::memory_order_relaxed);
  DataLogFileHandler* const log = log_;
  if (loss_told_.exchange(true) || log == nullptr) return;
  log->WriteLine(kLogErr, "Capture file: packets are lost, %s", reason);
}

}  // namespace kral
