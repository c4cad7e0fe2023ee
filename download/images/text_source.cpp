// Text in files and in memory, and its cutting into lines of bounded length.
#include "download/images/text_source.h"

#include <algorithm>
#include <cstring>

#include "platform/file_util.h"

namespace kral::images {
namespace {

constexpr size_t kBufferSize = 0x10000;

}  // namespace

void TextFile::Closer::operator()(std::FILE* file) const {
  CloseStream(file);
}

bool TextFile::OpenForReading(const std::string& path) {
  file_.reset(OpenToRead(path));
  return file_ != nullptr;
}

bool TextFile::OpenForWriting(const std::string& path) {
  file_.reset(OpenToWrite(path));
  return file_ != nullptr;
}

bool TextFile::Close() {
  std::FILE* file = file_.release();
  return file == nullptr || CloseStream(file);
}

size_t TextFile::Read(std::span<char> buffer) {
  return file_ ? std::fread(buffer.data(), 1, buffer.size(), file_.get()) : 0;
}

void TextFile::Rewind() {
  if (file_) std::rewind(file_.get());
}

bool TextFile::Write(std::string_view text) {
  return file_ && std::fwrite(text.data(), 1, text.size(), file_.get()) == text.size();
}

size_t TextMemory::Read(std::span<char> buffer) {
  const size_t count = std::min(buffer.size(), text_.size() - position_);
  text_.copy(buffer.data(), count, position_);
  position_ += count;
  return count;
}

bool TextMemory::Write(std::string_view text) {
  text_.append(text);
  return true;
}

LineReader::LineReader(TextSource& source, size_t limit)
    : source_(source), limit_(limit), buffer_(std::max(kBufferSize, 2 * limit), '\0') {}

bool LineReader::Next(Line& line) {
  size_t searched = 0;
  const char* newline = nullptr;
  line.whole = true;
  for (;;) {
    const size_t waiting = end_ - begin_;
    newline = waiting == searched
                  ? nullptr
                  : static_cast<const char*>(std::memchr(buffer_.data() + begin_ + searched, '\n', waiting - searched));
    if (newline != nullptr) break;
    // Of a line that fills the buffer only the first part is kept, so that a file without line ends costs no memory.
    if (waiting == buffer_.size()) {
      line.whole = false;
      end_ = begin_ + limit_;
    }
    searched = end_ - begin_;
    if (!Fill()) break;
  }
  if (newline == nullptr && begin_ == end_) return false;
  const size_t stop = newline != nullptr ? static_cast<size_t>(newline - buffer_.data()) : end_;
  size_t length = stop - begin_;
  if (length > 0 && buffer_[begin_ + length - 1] == '\r') --length;
  line.whole = line.whole && length <= limit_;
  line.text = std::string_view(buffer_).substr(begin_, std::min(length, limit_));
  line.number = ++lines_;
  begin_ = newline != nullptr ? stop + 1 : end_;
  return true;
}

void LineReader::Rewind() {
  source_.Rewind();
  lines_ = 0;
  begin_ = end_ = 0;
}

// Moves what is left to the front and reads more behind it; false at the end of the text.
bool LineReader::Fill() {
  std::memmove(buffer_.data(), buffer_.data() + begin_, end_ - begin_);
  end_ -= begin_;
  begin_ = 0;
  const size_t count = source_.Read(std::span(buffer_).subspan(end_));
  end_ += count;
  return count != 0;
}

}  // namespace kral::images
