// Gathers records in memory and writes them in large pieces.
#include "transport/collection/batch_writer.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <new>
#include <thread>
#include <utility>

#include "base/at_exit.h"
#include "platform/file_util.h"
#include "platform/forced_unwind.h"

namespace kral {
namespace {

// A record is with the system at most so long after it came, or as soon as there is a good piece to write.
constexpr std::chrono::milliseconds kGatherTime{100};
constexpr size_t kGoodPiece = size_t{64} << 10;
constexpr size_t kBehind = 4 * kGoodPiece;
constexpr size_t kSlice = size_t{16} << 10;  // what the system copies in a few microseconds

CaptureSink SinkOf(std::FILE* opened) {
  const std::shared_ptr<std::FILE> file(opened, CloseStream);
  // Pieces are large already; without a buffer the result tells what the system has taken.
  std::setvbuf(file.get(), nullptr, _IONBF, 0);
  return CaptureSink(
      [file](std::span<const uint8_t> bytes) { return std::fwrite(bytes.data(), 1, bytes.size(), file.get()); },
      [file](size_t offset, std::span<const uint8_t> bytes) {
        if (std::fseek(file.get(), static_cast<long>(offset), SEEK_SET) != 0) return;
        std::fwrite(bytes.data(), 1, bytes.size(), file.get());
      });
}

}  // namespace

uint64_t MicrosecondsNow() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(now).count());
}

CaptureSink OpenCaptureFile(const std::string& path) {
  std::FILE* const opened = OpenToWrite(path);
  return opened != nullptr ? SinkOf(opened) : CaptureSink();
}

std::error_code MakeCaptureFile(const std::string& path, CaptureSink& sink) {
  std::FILE* opened = nullptr;
  if (const auto error = OpenToWriteNew(path, opened)) return error;
  sink = SinkOf(opened);
  return {};
}

bool BatchWriter::Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner) {
  const MutexLock control(control_mutex_);
  if (state_ == CaptureState::kRunning || (state_ == CaptureState::kEnding && !ended_.WaitFor(0))) return false;
  thread_.Join();
  state_ = CaptureState::kNone;
  bool started = false;
  const AtExit close_what_is_not_written([&] {
    if (!started) sink_ = {};
  });
  sink_ = open();
  if (!sink_ || !OnBegin()) return false;
  {
    const MutexLock lock(mutex_);
    stop_requested_ = false;
  }
  ended_.Reset();
  started = thread_.Start([this] { Run(); }, std::move(owner));
  if (started) state_ = CaptureState::kRunning;
  return started;
}

BatchWriter::Added BatchWriter::Add(std::span<const uint8_t> head, std::span<const uint8_t> body) {
  bool wake = false;
  {
    const MutexLock lock(mutex_);
    if (stop_requested_) return Added::kEnded;
    std::vector<uint8_t>& bytes = pending_.bytes;
    const size_t before = bytes.size();
    const size_t after = before + head.size() + body.size();
    if (after > room_) return Added::kNoRoom;
    try {
      if (after > bytes.capacity()) bytes.reserve(std::min(2 * after, room_));
    } catch (...) {
      PassForcedUnwind();
      return Added::kNoRoom;  // out of memory: like what the disk is too slow for
    }
    bytes.insert(bytes.end(), head.begin(), head.end());
    bytes.insert(bytes.end(), body.begin(), body.end());
    ++pending_.records;
    pending_records_.fetch_add(1, std::memory_order_relaxed);
    wake = before < kGoodPiece && after >= kGoodPiece;
  }
  if (wake) changed_.NotifyOne();
  return Added::kKept;
}

BatchWriter::Ended BatchWriter::End(uint32_t time_out_ms) {
  const MutexLock control(control_mutex_);
  if (state_ == CaptureState::kNone) return Ended::kNone;
  state_ = CaptureState::kEnding;
  {
    const MutexLock lock(mutex_);
    stop_requested_ = true;
    changed_.NotifyOne();
  }
  if (!ended_.WaitFor(time_out_ms)) return Ended::kNotYet;
  thread_.Join();
  state_ = CaptureState::kNone;
  return Ended::kDone;
}

bool BatchWriter::GoOnIn(const std::function<CaptureSink()>& open) {
  sink_ = {};
  try {
    sink_ = open();
  } catch (const std::bad_alloc&) {
    return false;
  }
  return static_cast<bool>(sink_);
}

void BatchWriter::Run() {
  const AtExit ended([this] {
    sink_ = {};
    ended_.Set();
  });
  Batch batch;
  while (TakeBatch(batch)) {
    OnBatch(batch);
    pending_records_.fetch_sub(batch.records, std::memory_order_relaxed);
  }
  OnEnd();
}

// Looks by itself whether anything came: to be woken by the first record of each batch would hold the connection up
// more than the looks cost. False at the end.
bool BatchWriter::TakeBatch(Batch& batch) {
  batch.bytes.clear();
  batch.records = 0;
  MutexLock lock(mutex_);
  changed_.WaitFor(lock, kGatherTime,
                   [this]() KRAL_REQUIRES(mutex_) { return stop_requested_ || pending_.bytes.size() >= kGoodPiece; });
  std::swap(batch, pending_);
  return batch.records != 0 || !stop_requested_;
}

// After each slice whoever waits for this processor may have it: on a machine of few, that may be the answer to a
// command. A writer that has fallen behind gives nothing away.
size_t BatchWriter::Write(std::span<const uint8_t> bytes) {
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

}  // namespace kral
