// Files and folders of the system, by its own functions.
#include "platform/posix/system_files.h"

#include <dirent.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <new>
#include <utility>

#include "platform/file_util.h"
#include "platform/posix/last_error.h"

namespace kral {
namespace {

namespace fs = std::filesystem;

void ThrowIfNoMemory(const std::error_code& error) {
  if (error == std::errc::not_enough_memory) throw std::bad_alloc();
}

}  // namespace

std::error_code ReadNames(const fs::path& folder, std::vector<std::string>& names) {
  const std::unique_ptr<DIR, int (*)(DIR*)> opened(::opendir(folder.c_str()), ::closedir);
  if (!opened) return LastError();
  for (;;) {
    errno = 0;
    const dirent* const entry = ::readdir(opened.get());
    if (entry == nullptr) return LastError();
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") names.emplace_back(name);
  }
}

std::optional<std::vector<std::string>> NamesIn(const fs::path& folder) {
  std::vector<std::string> names;
  const std::error_code error = ReadNames(folder, names);
  ThrowIfNoMemory(error);
  return error ? std::nullopt : std::optional(std::move(names));
}

bool Exists(const fs::path& path) {
  return ::access(path.c_str(), F_OK) == 0;
}

// Their size is not known before: many of them are made while they are read.
std::string TextOf(const fs::path& file) {
  std::string text;
  FileReader reader;
  std::error_code error = reader.Open(file.string());
  std::array<uint8_t, 4096> piece{};
  for (size_t count = piece.size(); !error && count == piece.size();) {
    error = reader.Read(piece, count);
    text.append(piece.begin(), piece.begin() + static_cast<std::ptrdiff_t>(count));
  }
  ThrowIfNoMemory(error);
  return text;
}

std::string FirstLineOf(const fs::path& file) {
  std::string text = TextOf(file);
  text.resize(std::min(text.size(), text.find('\n')));
  return text;
}

std::optional<fs::path> RealPath(const fs::path& path) {
  const std::unique_ptr<char, void (*)(void*)> real(::realpath(path.c_str(), nullptr), std::free);
  if (real) return fs::path(real.get());
  ThrowIfNoMemory(LastError());
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
