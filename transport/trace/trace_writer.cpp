// The tap of a trace, which only copies bytes, and the thread behind it, which makes frames of them.
#include "transport/trace/trace_writer.h"

#include <algorithm>
#include <new>
#include <utility>

#include "base/text_log.h"
#include "transport/line/hdlc_frame.h"

namespace kral {

TraceWriter::~TraceWriter() {
  Stop();
}

bool TraceWriter::Start(const TraceOrigin& origin, const std::function<CaptureSink()>& open,
                        std::shared_ptr<void> owner) {
  const MutexLock control(control_mutex_);
  if (mode_ == Mode::kLatest || state() == CaptureState::kRunning) return false;
  origin_ = origin;
  if (!BatchWriter::Start(open, std::move(owner))) return false;
  const MutexLock lock(tap_mutex_);
  gaps_ = {};
  mode_ = Mode::kFile;
  return true;
}

bool TraceWriter::OnBegin() {
  lost_before_ = lost_.load();
  loss_told_ = false;
  return file_.Begin(origin_, [this](std::span<const uint8_t> bytes) { return Write(bytes); });
}

void TraceWriter::OnBatch(const Batch& batch) {
  file_.Take(batch.bytes, [this](std::span<const uint8_t> bytes) { return Write(bytes); });
  Count(file_.TakeOutcome());
}

// What was lost last is told here: nothing came behind it.
void TraceWriter::OnEnd() {
  const auto write = [this](std::span<const uint8_t> bytes) { return Write(bytes); };
  for (const auto direction : {PortDirection::kReceived, PortDirection::kSent}) {
    const MutexLock lock(tap_mutex_);
    const TrafficPiece gap = GapPiece({.direction = direction});
    if (gap.kind == TrafficPiece::Kind::kGap) file_.Take(gap.Head(), write);
  }
  file_.End(MicrosecondsNow(), lost_ - lost_before_, write);
  Count(file_.TakeOutcome());
}

void TraceWriter::Count(const TraceFile::Outcome& outcome) {
  frames_ += outcome.frames;
  bad_ += outcome.bad;
  others_ += outcome.others;
  lost_ += outcome.cut + outcome.unwritten + outcome.unmade;
  if (outcome.unwritten != 0) TellLoss("the file cannot be written any more");
  if (outcome.unmade != 0) TellLoss("out of memory");
}

void TraceWriter::TellLoss(const char* reason) {
  if (!loss_told_.exchange(true)) log_.WriteLine(kLogErr, "Trace file: frames are lost, %s", reason);
}

bool TraceWriter::Stop(uint32_t time_out_ms) {
  const MutexLock control(control_mutex_);
  {
    const MutexLock lock(tap_mutex_);
    const bool kept = mode_ == Mode::kLatest;
    mode_ = Mode::kOff;
    latest_.clear();
    latest_size_ = 0;
    if (kept) return true;
  }
  const Ended ended = End(time_out_ms);
  if (ended == Ended::kNotYet) {
    log_.WriteLine(kLogErr, "Trace file: %u pieces still wait for the disk", static_cast<unsigned>(pending()));
  }
  return ended == Ended::kDone && lost_ == lost_before_;
}

bool TraceWriter::KeepLatest(size_t bytes) {
  const MutexLock control(control_mutex_);
  if (state() != CaptureState::kNone) return false;
  const MutexLock lock(tap_mutex_);
  latest_.clear();
  latest_size_ = 0;
  latest_room_ = bytes;
  latest_cut_ = false;
  latest_open_ = false;
  mode_ = Mode::kLatest;
  return true;
}

bool TraceWriter::Save(const TraceOrigin& origin, const std::function<CaptureSink()>& open) {
  const MutexLock control(control_mutex_);
  std::deque<std::vector<uint8_t>> pieces;
  TrafficPiece earlier;
  {
    const MutexLock lock(tap_mutex_);
    if (mode_ != Mode::kLatest) return false;
    pieces = latest_;
    earlier.kind = latest_cut_ ? TrafficPiece::Kind::kEarlier : TrafficPiece::Kind::kBytes;
    earlier.of = latest_open_ ? 1 : 0;
  }
  const CaptureSink sink = open();
  TraceFile file;
  if (!sink || !file.Begin(origin, sink)) return false;
  if (earlier.kind == TrafficPiece::Kind::kEarlier) file.Take(earlier.Head(), sink);
  for (const auto& piece : pieces) file.Take(piece, sink);
  file.End(MicrosecondsNow(), 0, sink);
  const TraceFile::Outcome outcome = file.TakeOutcome();
  if (outcome.unmade != 0) throw std::bad_alloc();
  return outcome.unwritten == 0;
}

TraceCounters TraceWriter::counters() const {
  return {frames_, bad_, others_, lost_, lost_bytes_};
}

void TraceWriter::OnOpened() noexcept {
  Pass({.kind = TrafficPiece::Kind::kOpened});
}

void TraceWriter::OnGivenUp() noexcept {
  Pass({.kind = TrafficPiece::Kind::kGivenUp});
}

void TraceWriter::OnBytes(PortDirection direction, PortContent content, std::span<const uint8_t> bytes) noexcept {
  if (!bytes.empty()) Pass({.direction = direction, .content = content, .bytes = bytes});
}

void TraceWriter::OnShortWrite(size_t written, size_t count) noexcept {
  Pass({.kind = TrafficPiece::Kind::kShortWrite,
        .direction = PortDirection::kSent,
        .count = static_cast<uint32_t>(written),
        .of = static_cast<uint32_t>(count)});
}

void TraceWriter::Pass(TrafficPiece piece) noexcept {
  if (mode_.load(std::memory_order_relaxed) == Mode::kOff) return;
  const MutexLock lock(tap_mutex_);
  piece.microseconds = MicrosecondsNow();
  if (mode_ == Mode::kFile) PassToFile(piece);
  if (mode_ == Mode::kLatest) Keep(piece);
}

void TraceWriter::PassToFile(const TrafficPiece& piece) {
  if (!CloseGap(piece)) return Lose(piece);
  switch (Add(piece.Head(), piece.bytes)) {
    case Added::kKept:
      if (piece.content == PortContent::kFrames && !piece.bytes.empty()) {
        gaps_[static_cast<size_t>(piece.direction)].in_frame = piece.bytes.back() != kFrameFlag;
      }
      break;
    case Added::kNoRoom:
      Lose(piece);
      break;
    case Added::kEnded:
      break;
  }
}

// The first piece behind a gap comes with what is missing; false when there is no room even for that.
bool TraceWriter::CloseGap(const TrafficPiece& piece) {
  Gap& gap = gaps_[static_cast<size_t>(piece.direction)];
  if (gap.bytes == 0) return true;
  if (Add(GapPiece(piece).Head(), {}) == Added::kNoRoom) return false;
  gap.bytes = 0;
  gap.frames = 0;
  return true;
}

// Of the direction of a piece; the piece itself where nothing is missing in front of it.
TrafficPiece TraceWriter::GapPiece(TrafficPiece piece) {
  const Gap& gap = gaps_[static_cast<size_t>(piece.direction)];
  if (gap.bytes == 0) return piece;
  piece.kind = TrafficPiece::Kind::kGap;
  piece.bytes = {};
  piece.count = gap.frames;
  piece.of = gap.in_frame ? 1 : 0;
  return piece;
}

void TraceWriter::Lose(const TrafficPiece& piece) {
  Gap& gap = gaps_[static_cast<size_t>(piece.direction)];
  const uint32_t frames = piece.CountLost(gap.in_frame);
  gap.bytes += std::max<size_t>(piece.bytes.size(), 1);
  gap.frames += frames;
  lost_ += frames;
  lost_bytes_ += piece.bytes.size();
  TellLoss("the disk is too slow");
}

void TraceWriter::Keep(const TrafficPiece& piece) {
  try {
    const auto head = piece.Head();
    std::vector<uint8_t> kept(head.begin(), head.end());
    kept.insert(kept.end(), piece.bytes.begin(), piece.bytes.end());
    const size_t size = kept.size();
    latest_.push_back(std::move(kept));
    latest_size_ += size;
  } catch (const std::bad_alloc&) {
    latest_cut_ = true;  // like what is thrown out
  }
  while (latest_size_ > latest_room_ && !latest_.empty()) {
    TrafficPiece oldest;
    std::span<const uint8_t> bytes(latest_.front());
    if (oldest.Take(bytes) && oldest.direction == PortDirection::kReceived && !oldest.bytes.empty()) {
      latest_open_ = oldest.content == PortContent::kFrames && oldest.bytes.back() != kFrameFlag;
    }
    latest_cut_ = true;
    latest_size_ -= latest_.front().size();
    latest_.pop_front();
  }
}

}  // namespace kral
