// Files in one go, on either platform.
#include "platform/file_util.h"

#include <algorithm>
#include <utility>

namespace kral {
namespace {

constexpr size_t kPieceSize = 65536;

}  // namespace

std::error_code ReadWholeFile(const std::string& path, size_t limit, std::vector<uint8_t>& bytes) {
  FileReader file;
  if (const auto error = file.Open(path, FileReader::Others::kMayWrite)) return error;
  if (file.size() > limit) return std::make_error_code(std::errc::file_too_large);
  limit = std::min(limit, SIZE_MAX - 1);
  std::vector<uint8_t> content;
  // A vector that grows copies a large file once more.
  content.reserve(static_cast<size_t>(file.size()) + kPieceSize);
  // Pieces rather than the size: that is 0 for what /proc has, and may change meanwhile.
  size_t used = 0;
  do {
    content.resize(used + std::min(kPieceSize, limit + 1 - used));
    size_t count = 0;
    if (const auto error = file.Read(std::span(content).subspan(used), count)) return error;
    used += count;
    if (used > limit) return std::make_error_code(std::errc::file_too_large);
  } while (used == content.size());
  content.resize(used);
  bytes = std::move(content);
  return {};
}

std::error_code ReplaceWholeFile(const std::string& path, std::span<const uint8_t> bytes) {
  AtomicFile file;
  if (const auto error = file.Open(path)) return error;
  if (const auto error = file.Write(bytes)) return error;
  return file.Commit();
}

}  // namespace kral
