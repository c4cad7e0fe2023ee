// Whole files on Windows. Names are in the system's ANSI code page, as callers pass them.
#include "platform/file_util.h"

#include <windows.h>

#include <algorithm>
#include <utility>

#include "platform/win32/win_handle.h"

namespace kral {
namespace {

constexpr size_t kPieceSize = 65536;
constexpr int kNameAttempts = 64;
constexpr size_t kLargestPiece = 1u << 24;

std::error_code LastError() {
  switch (::GetLastError()) {
    case ERROR_FILE_NOT_FOUND:
    case ERROR_PATH_NOT_FOUND:
    case ERROR_INVALID_NAME:
      return std::make_error_code(std::errc::no_such_file_or_directory);
    case ERROR_ACCESS_DENIED:
    case ERROR_WRITE_PROTECT:
      return std::make_error_code(std::errc::permission_denied);
    case ERROR_SHARING_VIOLATION:
    case ERROR_LOCK_VIOLATION:
      return std::make_error_code(std::errc::device_or_resource_busy);
    case ERROR_DISK_FULL:
    case ERROR_HANDLE_DISK_FULL:
      return std::make_error_code(std::errc::no_space_on_device);
    case ERROR_FILE_EXISTS:
    case ERROR_ALREADY_EXISTS:
      return std::make_error_code(std::errc::file_exists);
    default:
      return std::make_error_code(std::errc::io_error);
  }
}

}  // namespace

std::FILE* OpenToRead(const std::string& path) {
  return std::fopen(path.c_str(), "rb");
}

std::error_code ReadWholeFile(const std::string& path, size_t limit, std::vector<uint8_t>& bytes) {
  const WinHandle file(::CreateFileA(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                                     OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!file.valid()) return LastError();
  limit = std::min(limit, SIZE_MAX - 1);
  std::vector<uint8_t> content;
  for (size_t used = 0;;) {
    content.resize(used + std::min(kPieceSize, limit + 1 - used));
    DWORD received = 0;
    const auto room = static_cast<DWORD>(content.size() - used);
    if (!::ReadFile(file.get(), content.data() + used, room, &received, nullptr)) return LastError();
    used += received;
    if (used > limit) return std::make_error_code(std::errc::file_too_large);
    if (received > 0) continue;
    content.resize(used);
    bytes = std::move(content);
    return {};
  }
}

struct FileReader::State {
  WinHandle file;
  uint64_t size = 0;
};

FileReader::FileReader() : state_(std::make_unique<State>()) {}
FileReader::~FileReader() = default;

std::error_code FileReader::Open(const std::string& path) {
  Close();
  WinHandle file(::CreateFileA(path.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING,
                               FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!file.valid()) return LastError();
  LARGE_INTEGER size{};
  if (::GetFileType(file.get()) != FILE_TYPE_DISK || !::GetFileSizeEx(file.get(), &size)) {
    return std::make_error_code(std::errc::invalid_argument);
  }
  state_->file = std::move(file);
  state_->size = static_cast<uint64_t>(size.QuadPart);
  return {};
}

void FileReader::Close() {
  *state_ = State();
}

std::error_code FileReader::Read(std::span<uint8_t> buffer, size_t& count) {
  count = 0;
  while (count < buffer.size()) {
    DWORD received = 0;
    const auto piece = static_cast<DWORD>(std::min(buffer.size() - count, kLargestPiece));
    if (!::ReadFile(state_->file.get(), buffer.data() + count, piece, &received, nullptr)) return LastError();
    if (received == 0) break;
    count += received;
  }
  return {};
}

uint64_t FileReader::size() const {
  return state_->size;
}

struct AtomicFile::State {
  WinHandle file;
  std::string path;
  std::string temporary;
  std::error_code failed;
};

AtomicFile::AtomicFile() : state_(std::make_unique<State>()) {}

AtomicFile::~AtomicFile() {
  if (!state_->file.valid()) return;
  state_->file = WinHandle();
  ::DeleteFileA(state_->temporary.c_str());
}

std::error_code AtomicFile::Open(const std::string& path) {
  State& state = *state_;
  if (state.file.valid()) return std::make_error_code(std::errc::device_or_resource_busy);
  state.failed = {};
  state.path = path;
  for (int attempt = 0; attempt < kNameAttempts; ++attempt) {
    state.temporary = path + "." + std::to_string(::GetCurrentProcessId()) + "." + std::to_string(attempt) + ".tmp";
    state.file = WinHandle(
        ::CreateFileA(state.temporary.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, nullptr));
    if (state.file.valid()) return {};
    if (::GetLastError() != ERROR_FILE_EXISTS) break;
  }
  return state.failed = LastError();
}

std::error_code AtomicFile::Write(std::span<const uint8_t> bytes) {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  while (!state.failed && !bytes.empty()) {
    const auto piece = static_cast<DWORD>(std::min(bytes.size(), kLargestPiece));
    DWORD written = 0;
    if (!::WriteFile(state.file.get(), bytes.data(), piece, &written, nullptr)) {
      state.failed = LastError();
    } else if (written == 0) {
      state.failed = std::make_error_code(std::errc::io_error);
    }
    bytes = bytes.subspan(written);
  }
  return state.failed;
}

std::error_code AtomicFile::Commit() {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  if (state.failed) return state.failed;
  if (!::FlushFileBuffers(state.file.get())) return state.failed = LastError();
  state.file = WinHandle();  // an open file cannot be moved
  if (::MoveFileExA(state.temporary.c_str(), state.path.c_str(), MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH)) {
    return {};
  }
  state.failed = LastError();
  ::DeleteFileA(state.temporary.c_str());
  return state.failed;
}

std::error_code ReplaceWholeFile(const std::string& path, std::span<const uint8_t> bytes) {
  AtomicFile file;
  if (const auto error = file.Open(path)) return error;
  if (const auto error = file.Write(bytes)) return error;
  return file.Commit();
}

}  // namespace kral
