// Entry records and contents of backed-up files. A content must be as long as its entry tells.
#include "storage/pkv/file_section.h"

#include <algorithm>
#include <map>
#include <optional>

#include "base/little_endian.h"

namespace kral::pkv {
namespace {

std::vector<uint8_t> EntryRecord(const PkvEfsFile& file) {
  std::vector<uint8_t> record(kEntryPath + file.path.size());
  StoreLe<uint32_t>(record, 0, file.mode);
  StoreLe<uint32_t>(record, kEntrySize, static_cast<uint32_t>(file.bytes.size()));
  std::ranges::copy(file.path, record.begin() + kEntryPath);
  return record;
}

// A path with a zero in it would reach the handset as another one.
bool ParseEntry(const std::vector<uint8_t>& record, const CompoundStream* data, PkvEfsFile& file) {
  if (record.size() <= kEntryPath || data == nullptr) return false;
  if (LoadLe<uint32_t>(record, kEntrySize) != data->bytes.size()) return false;
  file.mode = *LoadLe<uint32_t>(record, 0);
  file.path.assign(record.begin() + kEntryPath, record.end());
  file.bytes = data->bytes;
  return file.path.find('\0') == std::string::npos;
}

std::map<uint32_t, const CompoundStream*> NumberedStreams(const CompoundStorage& storage) {
  std::map<uint32_t, const CompoundStream*> streams;
  for (const CompoundStream& stream : storage.streams) {
    if (const auto number = EntryOfName(stream.name)) streams.emplace(*number, &stream);
  }
  return streams;
}

}  // namespace

EfsEntryStorage::EfsEntryStorage(CompoundStorage& configuration, std::string_view name, Access access)
    : storage_(configuration.FindStorage(name)), access_(access) {
  if (storage_ == nullptr && access == Access::kReadWrite) storage_ = &configuration.OpenOrAddStorage(name);
  if (storage_ == nullptr) return;
  directory_ = storage_->FindStorage(kEfsDirectory);
  data_ = storage_->FindStorage(kEfsData);
  if (access == Access::kRead) return;
  directory_ = &storage_->OpenOrAddStorage(kEfsDirectory);
  data_ = &storage_->OpenOrAddStorage(kEfsData);
  for (const auto& [number, entry] : NumberedStreams(*directory_)) {
    if (entry->bytes.size() <= kEntryPath) continue;
    const std::string path(entry->bytes.begin() + kEntryPath, entry->bytes.end());
    numbers_.emplace(PathKey(path), number);
  }
  for (const CompoundStorage* part : {directory_, data_}) {
    for (const auto& [number, stream] : NumberedStreams(*part)) used_.insert(number);
  }
}

bool EfsEntryStorage::Write(const PkvEfsFile& file) {
  if (access_ == Access::kRead) return false;
  const auto [known, added] = numbers_.emplace(PathKey(file.path), next_number_);
  if (added) {
    while (!used_.insert(next_number_).second) ++next_number_;
    known->second = next_number_;
  }
  const std::string name = EntryName(known->second);
  if (added) {
    directory_->streams.push_back({name, {}});  // no search: the number is new
    data_->streams.push_back({name, {}});
  }
  CompoundStream& entry = added ? directory_->streams.back() : directory_->OpenOrAddStream(name);
  CompoundStream& content = added ? data_->streams.back() : data_->OpenOrAddStream(name);
  entry.bytes = EntryRecord(file);
  content.bytes = file.bytes;
  return true;
}

void EfsEntryStorage::Remove(std::string_view path) {
  const auto known = numbers_.find(PathKey(path));
  if (known == numbers_.end()) return;
  const std::string name = EntryName(known->second);
  const auto is_of_path = [&name](const CompoundStream& stream) { return stream.name == name; };
  directory_->streams.remove_if(is_of_path);
  data_->streams.remove_if(is_of_path);
  numbers_.erase(known);
}

bool EfsEntryStorage::Read(std::vector<PkvEfsFile>& files, std::string& problem) const {
  if (directory_ == nullptr) return true;
  const auto contents = data_ != nullptr ? NumberedStreams(*data_) : std::map<uint32_t, const CompoundStream*>();
  for (const auto& [number, entry] : NumberedStreams(*directory_)) {
    const auto content = contents.find(number);
    PkvEfsFile file;
    if (!ParseEntry(entry->bytes, content != contents.end() ? content->second : nullptr, file)) {
      problem = storage_->name + "/" + std::string(kEfsDirectory) + "/" + entry->name + " is damaged";
      return false;
    }
    files.push_back(std::move(file));
  }
  return true;
}

CEFSItemBackup::CEFSItemBackup(CompoundStorage& configuration, Access access) : CEFSBackup(configuration, access) {
  if (storage_ == nullptr) return;
  items_ =
      access == Access::kReadWrite ? &storage_->OpenOrAddStorage(kBackupItems) : storage_->FindStorage(kBackupItems);
}

void WriteEfsFiles(CompoundStorage& configuration, const std::vector<PkvEfsFile>& files) {
  const auto is_item = [](const PkvEfsFile& file) { return file.is_item_file(); };
  const auto open = [&](auto& storage, std::string_view name, bool needed) {
    // A place without files is not made.
    if (needed || configuration.FindStorage(name) != nullptr) storage.emplace(configuration, Access::kReadWrite);
  };
  std::optional<CItemFileStgAccess> item_files;
  std::optional<CEFSBackup> others;
  open(item_files, kItemFiles, std::ranges::any_of(files, is_item));
  open(others, kEfsBackup, !std::ranges::all_of(files, is_item));
  for (const PkvEfsFile& file : files) {
    if (is_item(file)) {
      if (others) others->Remove(file.path);
      item_files->Write(file);
    } else {
      if (item_files) item_files->Remove(file.path);
      others->Write(file);
    }
  }
}

}  // namespace kral::pkv
