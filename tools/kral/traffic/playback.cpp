// Plays capture files through the library. What a verb makes of the packets is its own affair.
#include "tools/kral/traffic/playback.h"

#include <chrono>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <optional>
#include <utility>

#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"

namespace kral::tool {
namespace {

constexpr std::chrono::milliseconds kWait{50};

// A playback whose packets are taken by the callback, which tells their times, and not out of the log queue: the
// playback waits for whoever takes them here, at its recorded pace as well.
class Playback {
 public:
  Playback(KRAL_HANDLE handle, const std::string& file, Pace pace, const Stretch& stretch) : handle_(handle) {
    KRAL_ConfigurePlaybackCallBack(handle_, Take, reinterpret_cast<std::uintptr_t>(this));
    const auto library_pace = pace == Pace::kAsRecorded ? KRAL_PLAY_AS_RECORDED : KRAL_PLAY_AT_ONCE;
    started_ = KRAL_StartPlaybackBetween(handle_, file.c_str(), library_pace, stretch.from, stretch.to) != 0;
  }
  ~Playback() {
    {
      const std::lock_guard lock(mutex_);
      closed_ = true;
    }
    changed_.notify_all();
    KRAL_StopPlayback(handle_);
    KRAL_ConfigurePlaybackCallBack(handle_, nullptr, 0);
  }
  Playback(const Playback&) = delete;
  Playback& operator=(const Playback&) = delete;

  bool started() const { return started_; }
  std::int32_t state() const {
    std::int32_t state = KRAL_PLAYBACK_RUNNING;
    KRAL_GetPlaybackState(handle_, &state, nullptr, nullptr);
    return state;
  }

  std::optional<PlayedPacket> Next(std::chrono::milliseconds wait) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, wait, [this] { return !packets_.empty(); });
    if (packets_.empty()) return std::nullopt;
    auto packet = std::move(packets_.front());
    packets_.pop_front();
    changed_.notify_all();
    return packet;
  }

 private:
  static void KRAL_CALL Take(std::uint64_t microseconds, std::uint32_t length, const std::uint8_t* bytes,
                             std::uintptr_t value) noexcept {
    constexpr std::size_t kRoom = 256;
    auto& self = *reinterpret_cast<Playback*>(value);
    std::unique_lock lock(self.mutex_);
    self.changed_.wait(lock, [&self] { return self.closed_ || self.packets_.size() < kRoom; });
    if (self.closed_) return;
    self.packets_.push_back({microseconds, {bytes, bytes + length}});
    self.changed_.notify_all();
  }

  const KRAL_HANDLE handle_;
  bool started_ = false;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<PlayedPacket> packets_;
  bool closed_ = false;
};

}  // namespace

OfflineHandle::OfflineHandle() : handle_(0) {
  KRAL_SetDefaultReceiveMode(KRAL_RECEIVE_MODE_WAKE);
  handle_ = KRAL_ConnectServer(KRAL_PORT_NULL);
  if (handle_ == 0) {
    throw ToolError(ExitCode::kInternal, "no handle for the playback could be made",
                    "close other programs that use the library, then run the command again");
  }
}

OfflineHandle::~OfflineHandle() {
  KRAL_DisconnectServer(handle_);
}

namespace {

// Until the sink has had enough. Whether the file was whole.
bool Play(KRAL_HANDLE handle, const std::string& file, Pace pace, const Stretch& stretch,
          const std::function<bool(const PlayedPacket&)>& goes_on) {
  Playback playback(handle, file, pace, stretch);
  if (!playback.started()) {
    throw ExplainRecord(LastError(handle), "the playback", KRAL_PORT_NULL, "check the name and the permissions");
  }
  for (;;) {
    // Looked at before the packets: what a playback that has ended left here is taken still.
    const auto state = playback.state();
    const auto packet = playback.Next(state == KRAL_PLAYBACK_RUNNING ? kWait : kWait * 0);
    ThrowIfInterrupted();
    if (packet) {
      if (!goes_on(*packet)) return true;
    } else if (state == KRAL_PLAYBACK_FOREIGN) {
      throw ToolError(ExitCode::kBadFile, Format("{} is not a capture file", file),
                      "kral log capture writes such files");
    } else if (state != KRAL_PLAYBACK_RUNNING) {
      return state == KRAL_PLAYBACK_DONE;
    }
  }
}

}  // namespace

bool PlayFile(KRAL_HANDLE handle, const std::string& file, Pace pace,
              const std::function<void(const PlayedPacket&)>& sink, const Stretch& stretch) {
  return Play(handle, file, pace, stretch, [&](const PlayedPacket& packet) {
    sink(packet);
    return true;
  });
}

std::optional<std::uint64_t> BeginOf(KRAL_HANDLE handle, const std::string& file) {
  std::optional<std::uint64_t> begin;
  Play(handle, file, Pace::kAtOnce, {}, [&](const PlayedPacket& packet) {
    begin = packet.microseconds;
    return false;
  });
  return begin;
}

std::string TimeText(std::uint64_t microseconds) {
  constexpr std::uint64_t kEndOfYear9999 = 253'402'300'800'000'000;
  if (microseconds >= kEndOfYear9999) return std::to_string(microseconds);
  const std::chrono::sys_time<std::chrono::microseconds> time{std::chrono::microseconds(microseconds)};
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const std::chrono::year_month_day date(day);
  const std::chrono::hh_mm_ss clock(time - day);
  return Format("{:04}-{:02}-{:02}T{:02}:{:02}:{:02}.{:06}Z", static_cast<int>(date.year()),
                static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()), clock.hours().count(),
                clock.minutes().count(), clock.seconds().count(), clock.subseconds().count());
}

}  // namespace kral::tool
