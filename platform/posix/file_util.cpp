// Whole files on Linux.
#include "platform/file_util.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "platform/posix/file_descriptor.h"

namespace kral {
namespace {

constexpr size_t kPieceSize = 65536;
constexpr int kNameAttempts = 64;

std::error_code LastError() {
  return {errno, std::generic_category()};
}

// Without waiting: the opening of a pipe would last until somebody writes into it. What /proc has is ordinary too.
std::error_code OpenOrdinary(const std::string& path, FileDescriptor& file) {
  FileDescriptor opened(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!opened.valid() || ::fstat(opened.get(), &status) != 0) return LastError();
  if (S_ISDIR(status.st_mode)) return std::make_error_code(std::errc::is_a_directory);
  if (!S_ISREG(status.st_mode)) return std::make_error_code(std::errc::invalid_argument);
  file = std::move(opened);
  return {};
}

}  // namespace

std::FILE* OpenToRead(const std::string& path) {
  FileDescriptor file;
  if (OpenOrdinary(path, file)) return nullptr;
  std::FILE* stream = ::fdopen(file.get(), "rb");
  if (stream != nullptr) file.Release();
  return stream;
}

std::error_code ReadWholeFile(const std::string& path, size_t limit, std::vector<uint8_t>& bytes) {
  FileDescriptor file;
  if (const auto error = OpenOrdinary(path, file)) return error;
  limit = std::min(limit, SIZE_MAX - 1);
  std::vector<uint8_t> content;
  // Pieces rather than the size from stat: that is 0 for /proc, and may change meanwhile.
  for (size_t used = 0;;) {
    content.resize(used + std::min(kPieceSize, limit + 1 - used));
    const ssize_t received = ::read(file.get(), content.data() + used, content.size() - used);
    if (received < 0 && errno == EINTR) continue;
    if (received < 0) return LastError();
    used += static_cast<size_t>(received);
    if (used > limit) return std::make_error_code(std::errc::file_too_large);
    if (received > 0) continue;
    content.resize(used);
    bytes = std::move(content);
    return {};
  }
}

struct FileReader::State {
  FileDescriptor file;
  uint64_t size = 0;
};

FileReader::FileReader() : state_(std::make_unique<State>()) {}
FileReader::~FileReader() = default;

std::error_code FileReader::Open(const std::string& path) {
  Close();
  FileDescriptor file;
  struct stat status {};
  if (const auto error = OpenOrdinary(path, file)) return error;
  if (::fstat(file.get(), &status) != 0) return LastError();
  state_->file = std::move(file);
  state_->size = static_cast<uint64_t>(status.st_size);
  return {};
}

void FileReader::Close() {
  *state_ = State();
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
  state.failed = {};
  state.path = path;
  for (int attempt = 0; attempt < kNameAttempts; ++attempt) {
    state.temporary = path + "." + std::to_string(::getpid()) + "." + std::to_string(attempt) + ".tmp";
    state.file = FileDescriptor(::open(state.temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666));
    if (state.file.valid()) return {};
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

std::error_code AtomicFile::Commit() {
  State& state = *state_;
  if (!state.file.valid()) return std::make_error_code(std::errc::bad_file_descriptor);
  if (state.failed) return state.failed;
  if (::fsync(state.file.get()) != 0) return state.failed = LastError();
  if (::rename(state.temporary.c_str(), state.path.c_str()) != 0) return state.failed = LastError();
  state.file = FileDescriptor();
  return {};
}

std::error_code ReplaceWholeFile(const std::string& path, std::span<const uint8_t> bytes) {
  AtomicFile file;
  if (const auto error = file.Open(path)) return error;
  if (const auto error = file.Write(bytes)) return error;
  return file.Commit();
}

}  // namespace kral
