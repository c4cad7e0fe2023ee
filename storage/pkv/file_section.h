// Files of the handset inside a PKV file: an entry record and the content per file, under one number.
#ifndef KRAL_STORAGE_PKV_FILE_SECTION_H
#define KRAL_STORAGE_PKV_FILE_SECTION_H

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "platform/compound_file.h"
#include "storage/pkv/nv_storage.h"
#include "storage/pkv/pkv_format.h"

namespace kral::pkv {

// One file of the handset with its full path and its mode (0xE000 in the high bits: an item file).
struct PkvEfsFile {
  std::string path;
  uint32_t mode = 0;
  std::vector<uint8_t> bytes;

  bool is_item_file() const { return (mode & 0xF000) == 0xE000; }
  uint32_t permissions() const { return mode & 0777; }
  bool operator==(const PkvEfsFile&) const = default;
};

// The pair of "EFS_Dir" and "EFS_Data" in a storage of its own below the configuration.
class EfsEntryStorage {
 public:
  // Appends a file, or puts it in the place of the one with its path. False when the storage was opened for reading.
  bool Write(const PkvEfsFile& file);
  // The file with this path, if it is there.
  void Remove(std::string_view path);
  // Appends the files in the order of their numbers; `problem` names a damaged entry.
  bool Read(std::vector<PkvEfsFile>& files, std::string& problem) const;

 protected:
  EfsEntryStorage(CompoundStorage& configuration, std::string_view name, Access access);
  CompoundStorage* storage_;  // null: there is none and nothing may be created

 private:
  const Access access_;
  CompoundStorage* directory_ = nullptr;
  CompoundStorage* data_ = nullptr;
  std::map<std::string, uint32_t> numbers_;  // by PathKey
  std::set<uint32_t> used_;
  uint32_t next_number_ = 0;  // none below it is free
};

// The item files.
class CItemFileStgAccess final : public EfsEntryStorage {
 public:
  CItemFileStgAccess(CompoundStorage& configuration, Access access)
      : EfsEntryStorage(configuration, kItemFiles, access) {}
};

// All other files.
class CEFSBackup : public EfsEntryStorage {
 public:
  CEFSBackup(CompoundStorage& configuration, Access access) : EfsEntryStorage(configuration, kEfsBackup, access) {}
};

// An EFS backup with NV items of its own.
class CEFSItemBackup final : public CEFSBackup {
 public:
  CEFSItemBackup(CompoundStorage& configuration, Access access);

  // Null when there are none and nothing may be created.
  CompoundStorage* items() { return items_; }

 private:
  CompoundStorage* items_ = nullptr;
};

// Both kinds at once: item files to one place, all others to the other. One that was in the other place leaves it.
void WriteEfsFiles(CompoundStorage& configuration, const std::vector<PkvEfsFile>& files);

}  // namespace kral::pkv

#endif
