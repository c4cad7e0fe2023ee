// Where decoders read text from and encoders write it to: a file, or memory.
#ifndef KRAL_DOWNLOAD_IMAGES_TEXT_SOURCE_H
#define KRAL_DOWNLOAD_IMAGES_TEXT_SOURCE_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <utility>

namespace kral::images {

class TextSource {
 public:
  virtual ~TextSource() = default;
  virtual size_t Read(std::span<char> buffer) = 0;  // 0 at the end and on an error
  virtual void Rewind() = 0;
};

class TextSink {
 public:
  virtual ~TextSink() = default;
  virtual bool Write(std::string_view text) = 0;
};

// An open file. Lines are passed as they are on the disk: nothing is translated on either platform.
class TextFile final : public TextSource, public TextSink {
 public:
  bool OpenForReading(const std::string& path);
  bool OpenForWriting(const std::string& path);  // empties it
  bool Close();                                  // false when not everything reached the file

  size_t Read(std::span<char> buffer) override;
  void Rewind() override;
  bool Write(std::string_view text) override;

 private:
  struct Closer {
    void operator()(std::FILE* file) const;
  };

  std::unique_ptr<std::FILE, Closer> file_;
};

class TextMemory final : public TextSource, public TextSink {
 public:
  TextMemory() = default;
  explicit TextMemory(std::string text) : text_(std::move(text)) {}

  size_t Read(std::span<char> buffer) override;
  void Rewind() override { position_ = 0; }
  bool Write(std::string_view text) override;

  const std::string& text() const { return text_; }

 private:
  std::string text_;
  size_t position_ = 0;
};

// The lines of a source, without their endings ("\n" or "\r\n").
class LineReader {
 public:
  struct Line {
    std::string_view text;  // valid until the next call
    bool whole = true;      // false when the line is longer than the limit and was cut there
    uint64_t number = 0;    // from 1
  };

  LineReader(TextSource& source, size_t limit);

  bool Next(Line& line);
  void Rewind();

 private:
  bool Fill();

  TextSource& source_;
  const size_t limit_;
  std::string buffer_;
  uint64_t lines_ = 0;
  size_t begin_ = 0;  // what is read but not yet handed out
  size_t end_ = 0;
};

}  // namespace kral::images

#endif
