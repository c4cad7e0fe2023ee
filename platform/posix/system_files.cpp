// Files and folders of the system, by its own functions.
#include "platform/posix/system_files.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <new>
#include <utility>

#include "platform/posix/file_descriptor.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

void ThrowIfNoMemory() {
  if (errno == ENOMEM) throw std::bad_alloc();
}

}  // namespace

std::optional<std::vector<std::string>> NamesIn(const fs::path& folder) {
  const std::unique_ptr<DIR, int (*)(DIR*)> opened(::opendir(folder.c_str()), ::closedir);
  if (!opened) {
    ThrowIfNoMemory();
    return std::nullopt;
  }
  std::vector<std::string> names;
  for (;;) {
    errno = 0;
    const dirent* const entry = ::readdir(opened.get());
    if (entry == nullptr) break;
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") names.emplace_back(name);
  }
  ThrowIfNoMemory();
  return errno == 0 ? std::optional(std::move(names)) : std::nullopt;
}

// Their size is not known before: many of them are made while they are read.
std::string TextOf(const fs::path& file) {
  const FileDescriptor opened(::open(file.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
  if (!opened.valid()) {
    ThrowIfNoMemory();
    return {};
  }
  std::string text;
  std::array<char, 4096> piece{};
  for (;;) {
    const ssize_t count = ::read(opened.get(), piece.data(), piece.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) ThrowIfNoMemory();
    if (count <= 0) return text;
    text.append(piece.data(), static_cast<size_t>(count));
  }
}

std::string FirstLineOf(const fs::path& file) {
  std::string text = TextOf(file);
  text.resize(std::min(text.size(), text.find('\n')));
  return text;
}

std::optional<fs::path> RealPath(const fs::path& path) {
  const std::unique_ptr<char, void (*)(void*)> real(::realpath(path.c_str(), nullptr), std::free);
  if (real) return fs::path(real.get());
  ThrowIfNoMemory();
  return std::nullopt;
}

std::optional<std::string_view> TakeUntil(char separator, std::string_view& text) {
  if (text.empty()) return std::nullopt;
  const size_t end = std::min(text.find(separator), text.size());
  const std::string_view taken = text.substr(0, end);
  text.remove_prefix(std::min(end + 1, text.size()));
  return taken;
}

std::vector<std::string_view> WordsOf(std::string_view line) {
  std::vector<std::string_view> words;
  while (const auto word = TakeUntil(' ', line)) {
    if (!word->empty()) words.push_back(*word);
  }
  return words;
}

}  // namespace kral
