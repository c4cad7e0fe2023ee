// The library's own PKV file: every NV item in a stream of its own.
//
//   VARN_PkvFile file("phone.pkv");
//   file << item << other_item;
//   file.writeToDisk();
//
//   for (auto i = file.begin(); i != file.end(); ++i) Use(i->id, i->data);
//
// Written items are numbered records; read are those and item arrays too.
#ifndef KRAL_STORAGE_PKV_VARN_PKV_FILE_H
#define KRAL_STORAGE_PKV_VARN_PKV_FILE_H

#include <cstddef>
#include <iterator>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "storage/pkv/file_section.h"
#include "storage/pkv/phone_storage_file.h"

namespace kral::pkv {

class VARN_PkvFile {
 private:
  class IteratorImpl;
  struct Content;

 public:
  using NvItem = PkvNvItem;

  class Exception : public std::runtime_error {
   public:
    using std::runtime_error::runtime_error;
  };

  // Reads the next item with every advance; a copy goes its own way. It keeps what it reads alive, and does not see
  // what is added to the file later.
  class Iterator {
   public:
    using iterator_category = std::input_iterator_tag;
    using value_type = NvItem;
    using difference_type = std::ptrdiff_t;
    using pointer = const NvItem*;
    using reference = const NvItem&;

    Iterator();  // not initialized: everything but assignment raises an Exception
    ~Iterator();
    Iterator(const Iterator& other);
    Iterator& operator=(const Iterator& other);

    const NvItem& operator*() const;
    const NvItem* operator->() const;
    Iterator& operator++();
    Iterator operator++(int);
    bool operator==(const VARN_PkvFile::Iterator& rhs) const;
    bool operator!=(const VARN_PkvFile::Iterator& rhs) const;

   private:
    friend class VARN_PkvFile;
    explicit Iterator(std::unique_ptr<IteratorImpl> impl);
    IteratorImpl& impl(const char* operation) const;
    const NvItem& item(const char* operation) const;

    std::unique_ptr<IteratorImpl> impl_;
  };

  VARN_PkvFile();
  explicit VARN_PkvFile(std::string file_name);  // nothing is read or written yet
  ~VARN_PkvFile();
  VARN_PkvFile(const VARN_PkvFile&) = delete;
  VARN_PkvFile& operator=(const VARN_PkvFile&) = delete;

  // Reads the file, its properties too; what is added then and written joins what it holds, or takes its place. Raises
  // an Exception when it cannot be read.
  void open(const std::string& file_name);

  VARN_PkvFile& operator<<(const NvItem& item);
  VARN_PkvFile& operator<<(const PkvEfsFile& file);
  void setProperties(PkvProperties properties) { properties_ = std::move(properties); }

  // Replaces the file in one step. Raises an Exception when no NV item was added and when it cannot be written.
  void writeToDisk();

  // Of the file as it was opened; one that was named only is opened by the first begin().
  Iterator begin();
  Iterator end();

  // Bytes that the items, the files and the properties may take together; lower in tests only.
  void set_size_limit(size_t limit) { size_limit_ = limit; }

 private:
  void writeToDiskImpl(CPhoneStorageFile& file) const;

  std::string file_name_;
  std::shared_ptr<Content> content_;  // of the file that was read; null: none
  std::vector<NvItem> items_;
  std::vector<PkvEfsFile> files_;
  PkvProperties properties_;
  size_t size_limit_ = kCompoundFileLimit;
};

}  // namespace kral::pkv

#endif
