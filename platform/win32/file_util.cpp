// Whole files on Windows.
#include "platform/file_util.h"

#include <fcntl.h>
#include <io.h>
#include <windows.h>

#include <algorithm>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/folder.h"
#include "platform/temporary_name.h"
#include "platform/win32/last_error.h"
#include "platform/win32/wide_text.h"
#include "platform/win32/win_handle.h"

namespace kral {
namespace {

constexpr int kNameAttempts = 64;
constexpr size_t kLargestPiece = 1u << 24;
constexpr size_t kLongestPath = 1u << 15;
constexpr DWORD kShareAll = FILE_SHARE_READ | FILE_SHARE_WRITE;

bool IsOrdinary(HANDLE file) {
  return ::GetFileType(file) == FILE_TYPE_DISK;
}

bool TakesLines(HANDLE file) {
  return ::GetFileType(file) != FILE_TYPE_UNKNOWN;
}

struct Opening {
  DWORD access;
  DWORD sharing;
  DWORD creation;
};

// Devices have names as files have: CON, NUL, COM7, on many systems NUL.txt too.
std::error_code OpenIf(bool (*is_wanted)(HANDLE file), const std::string& path, const Opening& how, WinHandle& file) {
  WinHandle opened(::CreateFileW(WidePath(path).c_str(), how.access, how.sharing, nullptr, how.creation,
                                 FILE_ATTRIBUTE_NORMAL, nullptr));
  if (!opened.valid()) return LastError();
  if (!is_wanted(opened.get())) return std::make_error_code(std::errc::invalid_argument);
  file = std::move(opened);
  return {};
}

// Hands the file over to the C library. `flags` as it takes them: text mode, or binary.
std::FILE* MakeStream(WinHandle file, int flags, const char* mode) {
  const int descriptor = ::_open_osfhandle(reinterpret_cast<intptr_t>(file.get()), flags);
  if (descriptor < 0) return nullptr;
  file.Release();
  std::FILE* stream = ::_fdopen(descriptor, mode);
  if (stream == nullptr) ::_close(descriptor);
  return stream;
}

// Emptied only when it is known to be what is wanted.
std::FILE* OpenEmptied(bool (*is_wanted)(HANDLE file), const std::string& path, DWORD sharing, int flags,
                       const char* mode) {
  WinHandle file;
  if (OpenIf(is_wanted, path, {GENERIC_WRITE, sharing, OPEN_ALWAYS}, file)) return nullptr;
  if (IsOrdinary(file.get()) && !::SetEndOfFile(file.get())) return nullptr;
  return MakeStream(std::move(file), flags, mode);
}

// The name behind "\\.\"; empty for files. Nothing is opened.
std::wstring DeviceName(const std::string& path) {
  constexpr std::wstring_view kDevices = L"\\\\.\\";
  const std::wstring full = FullPath(WideText(path));
  return full.starts_with(kDevices) ? full.substr(kDevices.size()) : std::wstring();
}

// What a link leads to.
std::error_code Resolve(const std::wstring& path, std::wstring& target) {
  const WinHandle file(::CreateFileW(path.c_str(), 0, kShareAll | FILE_SHARE_DELETE, nullptr, OPEN_EXISTING,
                                     FILE_ATTRIBUTE_NORMAL, nullptr));
  std::vector<wchar_t> full(kLongestPath);
  const auto room = static_cast<DWORD>(full.size());
  const DWORD length = file.valid() ? ::GetFinalPathNameByHandleW(file.get(), full.data(), room, 0) : 0;
  if (length == 0) return LastError();
  if (length >= room) return std::make_error_code(std::errc::filename_too_long);
  target.assign(full.data(), length);
  return {};
}

// Where a new file takes the place of what a path leads to.
std::error_code FindTarget(const std::string& path, std::wstring& target) {
  // A temporary file beside nothing could be made, but never moved there.
  if (path.empty()) return std::make_error_code(std::errc::no_such_file_or_directory);
  if (!DeviceName(path).empty()) return std::make_error_code(std::errc::invalid_argument);
  target = WidePath(path);
  const DWORD attributes = ::GetFileAttributesW(target.c_str());
  if (attributes == INVALID_FILE_ATTRIBUTES) return {};
  if ((attributes & FILE_ATTRIBUTE_DIRECTORY) != 0) return std::make_error_code(std::errc::is_a_directory);
  return (attributes & FILE_ATTRIBUTE_REPARSE_POINT) != 0 ? Resolve(std::wstring(target), target) : std::error_code();
}

// The access list of a file that is replaced. A file system without any has none to keep.
void KeepAccess(const std::wstring& from, const std::wstring& to) {
  DWORD size = 0;
  ::GetFileSecurityW(from.c_str(), DACL_SECURITY_INFORMATION, nullptr, 0, &size);
  std::vector<uint8_t> list(size);
  if (size != 0 && ::GetFileSecurityW(from.c_str(), DACL_SECURITY_INFORMATION, list.data(), size, &size)) {
    ::SetFileSecurityW(to.c_str(), DACL_SECURITY_INFORMATION, list.data());
  }
}

}  // namespace

std::FILE* OpenToRead(const std::string& path) {
  WinHandle file;
  if (OpenIf(IsOrdinary, path, {GENERIC_READ, FILE_SHARE_READ, OPEN_EXISTING}, file)) return nullptr;
  return MakeStream(std::move(file), _O_RDONLY | _O_BINARY, "rb");
}

std::FILE* OpenToWrite(const std::string& path) {
  return OpenEmptied(IsOrdinary, path, FILE_SHARE_READ, _O_BINARY, "wb");
}

std::error_code OpenToWriteNew(const std::string& path, std::FILE*& stream) {
  WinHandle file;
  const auto error = OpenIf(IsOrdinary, path, {GENERIC_WRITE, FILE_SHARE_READ, CREATE_NEW}, file);
  if (error) return LookAt(path).kind != LocalKind::kMissing ? std::make_error_code(std::errc::file_exists) : error;
  stream = MakeStream(std::move(file), _O_BINARY, "wb");
  return stream != nullptr ? std::error_code() : std::make_error_code(std::errc::io_error);
}

// Neither shares a file with others that write.
bool IsInUse(const std::string& path) {
  WinHandle file;
  return OpenIf(IsOrdinary, path, {GENERIC_WRITE, kShareAll, OPEN_EXISTING}, file) ==
         std::errc::device_or_resource_busy;
}

bool CloseStream(std::FILE* stream) {
  return std::fclose(stream) == 0;
}

std::FILE* OpenToWriteText(const std::string& path) {
  // Only one may have a COM port open, and a handset may be behind it.
  if (::_wcsnicmp(DeviceName(path).c_str(), L"COM", 3) == 0) return nullptr;
  return OpenEmptied(TakesLines, path, kShareAll, _O_TEXT, "w");
}

struct FileReader::State {
  WinHandle file;
  uint64_t size = 0;
};

FileReader::FileReader() : state_(std::make_unique<State>()) {}
FileReader::~FileReader() = default;

std::error_code FileReader::Open(const std::string& path, Others others) {
  Close();
  const DWORD sharing = others == Others::kMayWrite ? kShareAll : FILE_SHARE_READ;
  WinHandle file;
  LARGE_INTEGER size{};
  if (const auto error = OpenIf(IsOrdinary, path, {GENERIC_READ, sharing, OPEN_EXISTING}, file)) return error;
  if (!::GetFileSizeEx(file.get(), &size)) return LastError();
  state_->file = std::move(file);
  state_->size = static_cast<uint64_t>(size.QuadPart);
  return {};
}

void FileReader::Close() {
  *state_ = State();
}

std::error_code FileReader::Seek(uint64_t offset) {
  LARGE_INTEGER place{};
  place.QuadPart = static_cast<LONGLONG>(offset);
  return ::SetFilePointerEx(state_->file.get(), place, nullptr, FILE_BEGIN) ? std::error_code() : LastError();
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
  std::wstring path;
  std::wstring temporary;
  std::error_code failed;
};

AtomicFile::AtomicFile() : state_(std::make_unique<State>()) {}

AtomicFile::~AtomicFile() {
  if (!state_->file.valid()) return;
  state_->file = WinHandle();
  ::DeleteFileW(state_->temporary.c_str());
}

std::error_code AtomicFile::Open(const std::string& path) {
  State& state = *state_;
  if (state.file.valid()) return std::make_error_code(std::errc::device_or_resource_busy);
  state.failed = FindTarget(path, state.path);
  if (state.failed) return state.failed;
  for (int attempt = 0; attempt < kNameAttempts; ++attempt) {
    state.temporary = TemporaryName(state.path, state.path.find_last_of(L"/\\:") + 1, ::GetCurrentProcessId(), attempt);
    state.file = WinHandle(
        ::CreateFileW(state.temporary.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, nullptr));
    if (state.file.valid()) {
      KeepAccess(state.path, state.temporary);
      return {};
    }
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

std::error_code AtomicFile::Rewrite(uint64_t offset, std::span<const uint8_t> bytes) {
  State& state = *state_;
  LARGE_INTEGER place{};
  place.QuadPart = static_cast<LONGLONG>(offset);
  if (!state.failed && !::SetFilePointerEx(state.file.get(), place, nullptr, FILE_BEGIN)) state.failed = LastError();
  return Write(bytes);
}

std::error_code AtomicFile::Commit() {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  if (state.failed) return state.failed;
  if (!::FlushFileBuffers(state.file.get())) return state.failed = LastError();
  state.file = WinHandle();  // an open file cannot be moved
  if (::MoveFileExW(state.temporary.c_str(), state.path.c_str(), MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH)) {
    return {};
  }
  state.failed = LastError();
  ::DeleteFileW(state.temporary.c_str());
  return state.failed;
}

}  // namespace kral
