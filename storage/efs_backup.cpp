// Entry records and contents of backed-up files. A content must be as long as its entry tells.
#include "storage/efs_backup.h"

#include <algorithm>
#include <map>

#include "frame/base/little_endian.h"

namespace kral {
namespace {

std::vector<uint8_t> EntryRecord(const PkvEfsFile& file) {
  std::vector<uint8_t> record(pkv::kEntryPath + file.path.size());
  StoreLe<uint32_t>(record, 0, file.mode);
  StoreLe<uint32_t>(record, pkv::kEntrySize, static_cast<uint32_t>(file.bytes.size()));
  std::copy(file.path.begin(), file.path.end(), record.begin() + pkv::kEntryPath);
  return record;
}

// A path with a zero in it would reach the handset as another one.
bool ParseEntry(const std::vector<uint8_t>& record, const CompoundStream* data, PkvEfsFile& file) {
  if (record.size() <= pkv::kEntryPath || data == nullptr) return false;
  if (LoadLe<uint32_t>(record, pkv::kEntrySize) != data->bytes.size()) return false;
  file.mode = *LoadLe<uint32_t>(record, 0);
  file.path.assign(record.begin() + pkv::kEntryPath, record.end());
  file.bytes = data->bytes;
  return file.path.find('\0') == std::string::npos;
}

std::map<uint32_t, const CompoundStream*> NumberedStreams(const CompoundStorage& storage) {
  std::map<uint32_t, const CompoundStream*> streams;
  for (const CompoundStream& stream : storage.streams) {
    if (const auto number = pkv::EntryOfName(stream.name)) streams.emplace(*number, &stream);
  }
  return streams;
}

}  // namespace

EfsEntryStorage::EfsEntryStorage(CompoundStorage& configuration, std::string_view name, pkv::Access access)
    : storage_(configuration.FindStorage(name)), access_(access) {
  if (storage_ == nullptr && access == pkv::Access::kReadWrite) storage_ = &configuration.OpenOrAddStorage(name);
  if (storage_ == nullptr) return;
  directory_ = storage_->FindStorage(pkv::kEfsDirectory);
  data_ = storage_->FindStorage(pkv::kEfsData);
  if (access == pkv::Access::kRead) return;
  directory_ = &storage_->OpenOrAddStorage(pkv::kEfsDirectory);
  data_ = &storage_->OpenOrAddStorage(pkv::kEfsData);
  for (const auto& [number, entry] : NumberedStreams(*directory_)) {
    if (entry->bytes.size() > pkv::kEntryPath)
      numbers_[{entry->bytes.begin() + pkv::kEntryPath, entry->bytes.end()}] = number;
  }
  for (const CompoundStorage* part : {directory_, data_}) {
    const auto streams = NumberedStreams(*part);
    if (!streams.empty()) next_number_ = std::max(next_number_, streams.rbegin()->first + 1);
  }
}

bool EfsEntryStorage::Write(const PkvEfsFile& file) {
  if (access_ == pkv::Access::kRead) return false;
  const auto [known, added] = numbers_.emplace(file.path, next_number_);
  const std::string name = pkv::EntryName(known->second);
  if (added) {
    ++next_number_;
    directory_->streams.push_back({name, {}});  // no search: the number is new
    data_->streams.push_back({name, {}});
  }
  CompoundStream& entry = added ? directory_->streams.back() : directory_->OpenOrAddStream(name);
  CompoundStream& content = added ? data_->streams.back() : data_->OpenOrAddStream(name);
  entry.bytes = EntryRecord(file);
  content.bytes = file.bytes;
  return true;
}

bool EfsEntryStorage::Read(std::vector<PkvEfsFile>& files, std::string& problem) const {
  if (directory_ == nullptr) return true;
  const auto contents = data_ != nullptr ? NumberedStreams(*data_) : std::map<uint32_t, const CompoundStream*>();
  for (const auto& [number, entry] : NumberedStreams(*directory_)) {
    const auto content = contents.find(number);
    PkvEfsFile file;
    if (!ParseEntry(entry->bytes, content != contents.end() ? content->second : nullptr, file)) {
      problem = storage_->name + "/" + std::string(pkv::kEfsDirectory) + "/" + entry->name + " is damaged";
      return false;
    }
    files.push_back(std::move(file));
  }
  return true;
}

CEFSItemBackup::CEFSItemBackup(CompoundStorage& configuration, pkv::Access access) : CEFSBackup(configuration, access) {
  if (storage_ == nullptr) return;
  items_ = access == pkv::Access::kReadWrite ? &storage_->OpenOrAddStorage(pkv::kBackupItems)
                                             : storage_->FindStorage(pkv::kBackupItems);
}

void WriteEfsFiles(CompoundStorage& configuration, const std::vector<PkvEfsFile>& files) {
  const auto is_item = [](const PkvEfsFile& file) { return file.is_item_file(); };
  const auto write_all = [&](EfsEntryStorage&& storage, bool items) {
    for (const PkvEfsFile& file : files) {
      if (file.is_item_file() == items) storage.Write(file);
    }
  };
  // A place without files is not made.
  if (std::any_of(files.begin(), files.end(), is_item))
    write_all(CItemFileStgAccess(configuration, pkv::Access::kReadWrite), true);
  if (!std::all_of(files.begin(), files.end(), is_item))
    write_all(CEFSBackup(configuration, pkv::Access::kReadWrite), false);
}

}  // namespace kral
