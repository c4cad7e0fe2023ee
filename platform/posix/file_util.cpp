// Whole files on Linux.
#include "platform/file_util.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <optional>
#include <utility>

#include "platform/folder.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/last_error.h"
#include "platform/temporary_name.h"

namespace kral {
namespace {

constexpr int kNameAttempts = 64;

bool IsOrdinary(mode_t mode) {
  return S_ISREG(mode);
}

bool TakesLines(mode_t mode) {
  return S_ISREG(mode) || S_ISCHR(mode) || S_ISFIFO(mode);
}

std::error_code KindError(mode_t mode) {
  return std::make_error_code(S_ISDIR(mode) ? std::errc::is_a_directory : std::errc::invalid_argument);
}

// Without waiting: the opening of a pipe would last until somebody comes to its other end. What /proc has is ordinary
// too.
std::error_code OpenIf(bool (*is_wanted)(mode_t mode), const std::string& path, int flags, FileDescriptor& file) {
  FileDescriptor opened(::open(path.c_str(), flags | O_NONBLOCK | O_NOCTTY | O_CLOEXEC, 0666));
  struct stat status {};
  if (!opened.valid() || ::fstat(opened.get(), &status) != 0) return LastError();
  if (!is_wanted(status.st_mode)) return KindError(status.st_mode);
  if (::fcntl(opened.get(), F_SETFL, 0) != 0) return LastError();
  file = std::move(opened);
  return {};
}

std::FILE* MakeStream(FileDescriptor file, const char* mode) {
  std::FILE* stream = ::fdopen(file.get(), mode);
  if (stream != nullptr) file.Release();
  return stream;
}

// Some file systems know no locks: that keeps nobody from a file.
bool IsHeldByAnother(int file, int lock) {
  return ::flock(file, lock | LOCK_NB) != 0 && errno == EWOULDBLOCK;
}

// Where a new file takes the place of what a path leads to. `mode` is that of a file which is there, or stays as it is.
std::error_code FindTarget(const std::string& path, std::string& target, std::optional<mode_t>& mode) {
  // A temporary file beside nothing could be made, but never moved there.
  if (path.empty()) return std::make_error_code(std::errc::no_such_file_or_directory);
  struct stat status {};
  if (::stat(path.c_str(), &status) == 0) {
    if (!S_ISREG(status.st_mode)) return KindError(status.st_mode);
    mode = status.st_mode & (S_IRWXU | S_IRWXG | S_IRWXO);
  }
  target = path;
  if (::lstat(path.c_str(), &status) != 0 || !S_ISLNK(status.st_mode)) return {};
  const std::unique_ptr<char, void (*)(void*)> resolved(::realpath(path.c_str(), nullptr), std::free);
  if (!resolved) return LastError();
  target = resolved.get();
  return {};
}

// A new name is on the disk once its folder is. One that may not be read, or that cannot be synchronised, is left to
// the system.
std::error_code SyncFolderOf(const std::string& path) {
  const size_t slash = path.rfind('/');
  const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
  const FileDescriptor file(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!file.valid() || ::fsync(file.get()) == 0 || errno == EINVAL || errno == ENOTSUP) return {};
  return LastError();
}

}  // namespace

std::FILE* OpenToRead(const std::string& path) {
  FileDescriptor file;
  if (OpenIf(IsOrdinary, path, O_RDONLY, file) || IsHeldByAnother(file.get(), LOCK_SH)) return nullptr;
  return MakeStream(std::move(file), "rb");
}

std::FILE* OpenToWrite(const std::string& path) {
  FileDescriptor file;
  if (OpenIf(IsOrdinary, path, O_WRONLY | O_CREAT, file) || IsHeldByAnother(file.get(), LOCK_EX)) return nullptr;
  // Only now: what another writes or reads is not emptied under it.
  if (::ftruncate(file.get(), 0) != 0) return nullptr;
  return MakeStream(std::move(file), "wb");
}

std::error_code OpenToWriteNew(const std::string& path, std::FILE*& stream) {
  FileDescriptor file;
  if (const auto error = OpenIf(IsOrdinary, path, O_WRONLY | O_CREAT | O_EXCL, file)) return error;
  if (IsHeldByAnother(file.get(), LOCK_EX)) return std::make_error_code(std::errc::file_exists);
  stream = MakeStream(std::move(file), "wb");
  return stream != nullptr ? std::error_code() : LastError();
}

bool IsInUse(const std::string& path) {
  FileDescriptor file;
  if (OpenIf(IsOrdinary, path, O_RDONLY, file)) return false;
  const bool is_held = IsHeldByAnother(file.get(), LOCK_EX);
  ::flock(file.get(), LOCK_UN);
  return is_held;
}

// A child process made meanwhile has the file open, too, and would keep it locked as long as it lives.
bool CloseStream(std::FILE* stream) {
  const bool flushed = std::fflush(stream) == 0;
  ::flock(::fileno(stream), LOCK_UN);
  return std::fclose(stream) == 0 && flushed;
}

std::FILE* OpenToWriteText(const std::string& path) {
  FileDescriptor file;
  struct stat status {};
  if (OpenIf(TakesLines, path, O_WRONLY | O_CREAT, file) || ::fstat(file.get(), &status) != 0) return nullptr;
  if (S_ISREG(status.st_mode)) {
    // What is being captured or played is not emptied. Several text logs may share a file: none of them holds it.
    if (IsHeldByAnother(file.get(), LOCK_EX) || ::ftruncate(file.get(), 0) != 0) return nullptr;
    ::flock(file.get(), LOCK_UN);
  }
  return MakeStream(std::move(file), "wb");
}

struct FileReader::State {
  FileDescriptor file;
  uint64_t size = 0;
};

FileReader::FileReader() : state_(std::make_unique<State>()) {}
FileReader::~FileReader() = default;

std::error_code FileReader::Open(const std::string& path, Others) {
  Close();
  FileDescriptor file;
  struct stat status {};
  if (const auto error = OpenIf(IsOrdinary, path, O_RDONLY, file)) return error;
  if (::fstat(file.get(), &status) != 0) return LastError();
  state_->file = std::move(file);
  state_->size = static_cast<uint64_t>(status.st_size);
  return {};
}

void FileReader::Close() {
  *state_ = State();
}

std::error_code FileReader::Seek(uint64_t offset) {
  return ::lseek(state_->file.get(), static_cast<off_t>(offset), SEEK_SET) < 0 ? LastError() : std::error_code();
}

std::error_code FileReader::Read(std::span<uint8_t> buffer, size_t& count) {
  count = 0;
  while (count < buffer.size()) {
    const ssize_t received = ::read(state_->file.get(), buffer.data() + count, buffer.size() - count);
    if (received < 0 && errno == EINTR) continue;
    if (received < 0) return LastError();
    if (received == 0) break;
    count += static_cast<size_t>(received);
  }
  return {};
}

uint64_t FileReader::size() const {
  return state_->size;
}

struct AtomicFile::State {
  FileDescriptor file;
  std::string path;
  std::string temporary;
  std::error_code failed;
};

AtomicFile::AtomicFile() : state_(std::make_unique<State>()) {}

AtomicFile::~AtomicFile() {
  if (state_->file.valid()) ::unlink(state_->temporary.c_str());
}

std::error_code AtomicFile::Open(const std::string& path) {
  if (state_->file.valid()) return std::make_error_code(std::errc::device_or_resource_busy);
  State& state = *state_;
  std::optional<mode_t> mode;
  state.failed = FindTarget(path, state.path, mode);
  if (state.failed) return state.failed;
  for (int attempt = 0; attempt < kNameAttempts; ++attempt) {
    state.temporary = TemporaryName(state.path, NameBegin(state.path), static_cast<unsigned long>(::getpid()), attempt);
    state.file =
        FileDescriptor(::open(state.temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, mode.value_or(0666)));
    if (state.file.valid()) {
      // The umask holds for new files only. A file system without modes has none to keep.
      if (mode) [[maybe_unused]]
        const int ignored = ::fchmod(state.file.get(), *mode);
      return {};
    }
    if (errno != EEXIST) break;
  }
  return state.failed = LastError();
}

std::error_code AtomicFile::Write(std::span<const uint8_t> bytes) {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  while (!state.failed && !bytes.empty()) {
    const ssize_t written = ::write(state.file.get(), bytes.data(), bytes.size());
    if (written > 0) {
      bytes = bytes.subspan(static_cast<size_t>(written));
    } else if (written == 0 || errno != EINTR) {
      state.failed = written == 0 ? std::make_error_code(std::errc::io_error) : LastError();
    }
  }
  return state.failed;
}

std::error_code AtomicFile::Rewrite(uint64_t offset, std::span<const uint8_t> bytes) {
  State& state = *state_;
  if (!state.failed && ::lseek(state.file.get(), static_cast<off_t>(offset), SEEK_SET) < 0) state.failed = LastError();
  return Write(bytes);
}

std::error_code AtomicFile::Commit() {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  if (state.failed) return state.failed;
  if (::fsync(state.file.get()) != 0) return state.failed = LastError();
  if (::rename(state.temporary.c_str(), state.path.c_str()) != 0) return state.failed = LastError();
  state.file = FileDescriptor();
  return state.failed = SyncFolderOf(state.path);
}

}  // namespace kral
