// The view of one file that is to be written into a handset. The download protocols ask an image for its base, size
// and start address and copy blocks out of it by address; they never touch files.
#ifndef KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_H
#define KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_H

#include <cstdint>
#include <exception>
#include <memory>
#include <string>
#include <vector>

namespace kral::images {

class PhoneImageDecoder;

// What every image operation throws.
class PhoneImageException : public std::exception {
 public:
  enum class Kind : uint32_t { kRead = 0, kWriteOrAllocation = 1 };

  // As a default argument: the line of the call. (std::source_location is not in every compiler we build with.)
  static constexpr uint32_t CallersLine(int line = __builtin_LINE()) { return static_cast<uint32_t>(line); }

  static PhoneImageException ReadFailure(uint32_t address, uint32_t count, uint32_t line = CallersLine()) {
    return {"Read Failure", address, count, Kind::kRead, line};
  }
  static PhoneImageException WriteFailure(uint32_t address, uint32_t count, uint32_t line = CallersLine()) {
    return {"Write Failure", address, count, Kind::kWriteOrAllocation, line};
  }
  static PhoneImageException PagedAllocation(uint32_t address, uint32_t count, uint32_t line = CallersLine()) {
    return {"Paged Allocation", address, count, Kind::kWriteOrAllocation, line};
  }
  // A raw binary refuses a read without saying why.
  static PhoneImageException Unnamed(uint32_t address, uint32_t count, uint32_t line = CallersLine()) {
    return {"", address, count, Kind::kRead, line};
  }

  const char* what() const noexcept override { return text_.c_str(); }
  uint32_t address() const { return address_; }  // or offset
  uint32_t count() const { return count_; }
  uint32_t line() const { return line_; }  // of the place that threw
  Kind kind() const { return kind_; }

 private:
  PhoneImageException(const char* text, uint32_t address, uint32_t count, Kind kind, uint32_t line)
      : text_(text), address_(address), count_(count), line_(line), kind_(kind) {}

  std::string text_;
  uint32_t address_;
  uint32_t count_;
  uint32_t line_;
  Kind kind_;
};

// An image has up to two regions, 0 and 1; the second exists only for HEX files with a block at 0x08000000. Addresses
// are those of the handset and wrap at 32 bits. What is const may be called by several threads at once: one image
// serves many downloads.
class PhoneImage {
 public:
  // The decoder, which may be null, is borrowed: it must outlive the image.
  explicit PhoneImage(PhoneImageDecoder* decoder = nullptr) : decoder_(decoder) {}
  virtual ~PhoneImage() = default;
  PhoneImage(const PhoneImage&) = delete;
  PhoneImage& operator=(const PhoneImage&) = delete;

  virtual void Clear() = 0;
  virtual uint32_t GetBaseAddress(uint32_t region) const = 0;
  virtual uint32_t GetTotalSize() const = 0;  // bytes of backing store
  virtual uint32_t GetSize(uint32_t region) const = 0;
  virtual uint32_t GetLastAddress(uint32_t region) const = 0;
  virtual uint32_t GetStartAddress() const = 0;
  virtual uint8_t* GetPointer(uint32_t offset) = 0;  // into the backing store
  virtual void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const = 0;
  virtual void SetBaseAddress(uint32_t value, uint32_t region) = 0;
  virtual void SetSize(uint32_t value, uint32_t region) = 0;
  virtual void SetStartAddress(uint32_t value) = 0;
  virtual void Write(uint32_t address, const void* data, uint32_t count, uint32_t region) = 0;

  PhoneImageDecoder* decoder() const { return decoder_; }

 protected:
  // A zeroed block that lives as long as the image.
  uint8_t* AddBlock(size_t size) { return blocks_.emplace_back(std::make_unique<uint8_t[]>(size)).get(); }

 private:
  PhoneImageDecoder* decoder_;
  std::vector<std::unique_ptr<uint8_t[]>> blocks_;
};

}  // namespace kral::images

#endif
