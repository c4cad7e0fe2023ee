// Moves bytes between a pseudo terminal and a handset as soon as either has some.
#include "handset/pty_cable.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <filesystem>
#include <system_error>

namespace kral::handset {
namespace {

constexpr uint32_t kIdleWaitMs = 1000;
constexpr uint32_t kReturnWaitMs = 20;
// A full terminal gives no sign when the host has read from it, and a full cable none at all.
constexpr uint32_t kFullWaitMs = 1;
constexpr size_t kChunk = size_t{64} << 10;

}  // namespace

PtyCable::PtyCable(VirtualHandset& handset, std::string link, uint32_t bytes_per_second)
    : handset_(handset),
      link_(std::move(link)),
      from_host_(bytes_per_second),
      to_host_(bytes_per_second),
      chunk_(kChunk) {}

std::unique_ptr<PtyCable> PtyCable::Attach(VirtualHandset& handset, std::string link, std::string& error,
                                           uint32_t bytes_per_second) {
  std::unique_ptr<PtyCable> cable(new PtyCable(handset, std::move(link), bytes_per_second));
  if (!cable->Plug(error)) return nullptr;
  handset.SetOutputListener([raw = cable.get()] {
    const std::lock_guard lock(raw->mutex_);
    if (raw->terminal_) raw->terminal_->Wake();
  });
  cable->thread_ = std::thread(&PtyCable::Run, cable.get());
  return cable;
}

PtyCable::~PtyCable() {
  stop_ = true;
  if (thread_.joinable()) {
    handset_.Wake();  // by the listener, the terminal's wait as well
    thread_.join();
    handset_.SetOutputListener(nullptr);
  }
  Unplug();
}

std::string PtyCable::device_path() const {
  const std::lock_guard lock(mutex_);
  return terminal_ ? terminal_->device_path() : std::string();
}

bool PtyCable::Plug(std::string& error) {
  appearance_ = handset_.appearances();
  auto terminal = OpenPseudoTerminal(error);
  if (!terminal) return false;
  if (!link_.empty()) {
    // An old link, left by a handset that was ended by force, gives way; a file or folder does not.
    std::error_code failure;
    if (std::filesystem::is_symlink(std::filesystem::symlink_status(link_, failure))) {
      std::filesystem::remove(link_, failure);
    }
    std::filesystem::create_symlink(terminal->device_path(), link_, failure);
    if (failure) {
      error = "no link " + link_ + ": " + failure.message();
      return false;
    }
  }
  const std::lock_guard lock(mutex_);
  terminal_ = std::move(terminal);
  return true;
}

void PtyCable::Unplug() {
  std::unique_ptr<PseudoTerminal> doomed;
  {
    const std::lock_guard lock(mutex_);
    doomed = std::move(terminal_);
  }
  if (!doomed || link_.empty()) return;
  std::error_code ignored;
  std::filesystem::remove(link_, ignored);
}

void PtyCable::Run() {
  while (!stop_) {
    if (terminal_) {
      Serve();
    } else {
      AwaitReturn();
    }
  }
}

// Only this thread changes terminal_ once it runs, so it reads it without the lock.
void PtyCable::Serve() {
  std::array<uint8_t, 4096> chunk;
  while (!stop_) {
    while (const size_t count = terminal_->Read(std::span(chunk).first(std::min(chunk.size(), from_host_.Room())))) {
      from_host_.Take(count);
      handset_.FromHost(std::span(chunk).first(count));
      Write();
    }
    if (handset_.vanished() || handset_.appearances() != appearance_) {
      chunk_begin_ = chunk_end_ = 0;
      return Unplug();
    }
    const bool room_left = Write();
    // What the cable has no room for would end every wait at once.
    if (from_host_.Room() == 0) {
      handset_.clock().SleepMs(kFullWaitMs);
      continue;
    }
    // What is put on the line from here on wakes the terminal, which keeps a wake that comes before the wait.
    const uint32_t wait = room_left ? std::min(kIdleWaitMs, handset_.MillisecondsToOutput()) : kFullWaitMs;
    if (wait > 0) terminal_->WaitReadable(wait);
  }
}

// Everything that is due; false when the terminal or the cable is full.
bool PtyCable::Write() {
  for (;;) {
    if (chunk_begin_ == chunk_end_) {
      chunk_begin_ = 0;
      chunk_end_ = handset_.ToHost(chunk_);
      if (chunk_end_ == 0) return true;
    }
    const size_t room = std::min(chunk_end_ - chunk_begin_, to_host_.Room());
    const size_t written = terminal_->Write(std::span(chunk_).subspan(chunk_begin_, room));
    to_host_.Take(written);
    chunk_begin_ += written;
    if (chunk_begin_ < chunk_end_) return false;
  }
}

void PtyCable::AwaitReturn() {
  std::string error;
  if (handset_.vanished() || !Plug(error)) std::this_thread::sleep_for(std::chrono::milliseconds(kReturnWaitMs));
}

}  // namespace kral::handset
