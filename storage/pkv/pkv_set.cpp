// Sets of items from and to PKV files, through the writer that the station has chosen.
#include "storage/pkv/pkv_set.h"

#include <algorithm>
#include <map>
#include <tuple>
#include <utility>

#include "base/little_endian.h"
#include "base/text_log.h"
#include "platform/station_switch.h"
#include "storage/pkv/nv_storage.h"
#include "storage/pkv/pkv_unread.h"
#include "storage/pkv/varn_pkv_file.h"

namespace kral::pkv {
namespace {

constexpr StationSwitch kUsePkvFile{.registry_key = "SOFTWARE\\Kral\\VARN\\UsePkvFile",
                                    .variable = "KRAL_USE_PKV_FILE"};

auto KeyOf(const PkvNvItem& item) {
  return std::tuple(item.subscription, item.id, item.index);
}

// The first one of several with the same key stays; the others are told when they are different.
void Normalize(std::vector<PkvNvItem>& items, std::vector<std::string>& dropped) {
  const auto comes_first = [](const auto& a, const auto& b) { return KeyOf(a) < KeyOf(b); };
  if (!std::ranges::is_sorted(items, comes_first)) std::ranges::stable_sort(items, comes_first);
  const auto is_again = [&](const PkvNvItem& first, const PkvNvItem& item) {
    if (KeyOf(first) != KeyOf(item)) return false;
    if (first != item) dropped.push_back("NV ID " + std::to_string(item.id) + ": a second value");
    return true;
  };
  items.erase(std::unique(items.begin(), items.end(), is_again), items.end());
}

void Normalize(std::vector<PkvEfsFile>& files, std::vector<std::string>& dropped) {
  std::map<std::string, size_t> kept;
  size_t count = 0;
  for (size_t i = 0; i < files.size(); ++i) {
    const auto [known, added] = kept.emplace(PathKey(files[i].path), count);
    if (added) {
      if (count != i) files[count] = std::move(files[i]);
      ++count;
      continue;
    }
    const PkvEfsFile& first = files[known->second];
    if (first.mode != files[i].mode || first.bytes != files[i].bytes) {
      dropped.push_back(files[i].path + ": a second content");
    }
  }
  files.resize(count);
}

void Normalize(PkvSet& set) {
  Normalize(set.items, set.unread);
  Normalize(set.files, set.unread);
}

// A record in use that tells another length is out of step: its value would be part of another one's.
bool AreRecordsWhole(const CompoundStorage& storage, uint16_t subscription) {
  const CompoundStream* const stream = storage.FindStream(NameOfSubscription(kItemArray, subscription));
  if (stream == nullptr) return true;
  const std::span<const uint8_t> bytes(stream->bytes);
  for (size_t at = 0; bytes.size() - at >= kArrayRecordSize; at += kArrayRecordSize) {
    const bool in_use = (*LoadLe<uint16_t>(bytes, at + kArrayFlags) & kRecordInUse) != 0;
    if (in_use && LoadLe<uint16_t>(bytes, at) != kArrayRecordSize) return false;
  }
  return true;
}

bool AppendItems(CompoundStorage& storage, std::vector<PkvNvItem>& items, std::string& problem) {
  for (const uint16_t subscription : CNVStorage::Subscriptions(storage)) {
    if (!AreRecordsWhole(storage, subscription)) {
      problem = NameOfSubscription(kItemArray, subscription) + " is damaged";
      return false;
    }
    CNVStorage source(storage, subscription, Access::kRead);
    source.OpenItemArray();
    source.item_array().AppendItems(items);
    if (!source.ReadNumbered(items, problem)) return false;
  }
  return true;
}

bool ReadConfiguration(CompoundStorage& configuration, PkvSet& set, std::string& problem) {
  if (!AppendItems(configuration, set.items, problem)) return false;
  CEFSItemBackup backup(configuration, Access::kRead);
  // Behind the configuration's own items, which come first where both have one.
  if (backup.items() != nullptr && !AppendItems(*backup.items(), set.items, problem)) return false;
  if (!CItemFileStgAccess(configuration, Access::kRead).Read(set.files, problem) || !backup.Read(set.files, problem)) {
    return false;
  }
  set.unread = UnreadParts(configuration);
  Normalize(set);
  return true;
}

// Plain items into the arrays; an array has one item per id, so indexed ones go beside it.
void WriteWithStorageClasses(const std::string& path, const PkvSet& set) {
  CPhoneStorageFile file;
  CompoundStorage& configuration = file.configuration();
  std::map<uint16_t, CNVStorage> arrays;
  std::map<uint16_t, CNVStorage> numbered;
  for (const PkvNvItem& item : set.items) {
    auto& storages = item.index == 0 ? arrays : numbered;
    const auto [place, added] =
        storages.try_emplace(item.subscription, configuration, item.subscription, Access::kReadWrite);
    if (added && item.index == 0) place->second.OpenItemArray();
    place->second.Write(item);
  }
  WriteEfsFiles(configuration, set.files);
  configuration.OpenOrAddStream(kPropertyInfo).bytes = CPhoneStorageFile::PropertyBytes(set.properties);
  file.root().OpenOrAddStream(kFileVersion).bytes = CPhoneStorageFile::VersionBytes();
  if (const std::string problem = file.Save(path); !problem.empty()) throw VARN_PkvFile::Exception(problem);
}

void WriteWithVarnPkvFile(const std::string& path, const PkvSet& set) {
  VARN_PkvFile file(path);
  for (const PkvNvItem& item : set.items) file << item;
  for (const PkvEfsFile& entry : set.files) file << entry;
  file.setProperties(set.properties);
  file.writeToDisk();
}

void LogWritten(DataLogFileHandler* log, const std::string& path, const PkvSet& set) {
  if (log == nullptr) return;
  if (log->Wants(kLogNvManagerDebug)) {
    for (const PkvNvItem& item : set.items) log->WriteLine(kLogNvManagerDebug, "Write NV %u", item.id);
    for (const PkvEfsFile& file : set.files) log->WriteLine(kLogNvManagerDebug, "Write NV EFS %s", file.path.c_str());
  }
  log->WriteLine(kLogRet, "PKV File: %s written", path.c_str());
}

}  // namespace

PkvOutcome ReadPkv(const std::string& path, PkvSet& set) {
  CPhoneStorageFile file;
  if (std::string problem = file.Open(path); !problem.empty()) return {PkvResult::kCannotOpen, std::move(problem)};
  CompoundStorage* const configuration = file.FindConfiguration();
  if (configuration == nullptr) return {PkvResult::kNoStorage, path + ": holds no phone configuration"};
  PkvSet read;
  read.properties = file.properties();
  std::string problem;
  if (!ReadConfiguration(*configuration, read, problem)) return {PkvResult::kDamagedItem, path + ": " + problem};
  set = std::move(read);
  return {};
}

void LogUnread(DataLogFileHandler& log, const std::string& path, const PkvSet& set) {
  constexpr size_t kMostLines = 20;
  for (size_t i = 0; i < std::min(set.unread.size(), kMostLines); ++i) {
    log.WriteLine(kLogErr, "%s: %s; passed over", path.c_str(), set.unread[i].c_str());
  }
  if (set.unread.empty()) return;
  log.WriteLine(kLogErr, "%s: %u parts passed over", path.c_str(), static_cast<unsigned>(set.unread.size()));
}

PkvWriter ChosenPkvWriter() {
  return IsSwitchSet(kUsePkvFile) ? PkvWriter::kVarnPkvFile : PkvWriter::kStorageClasses;
}

PkvOutcome WritePkv(const std::string& path, const PkvSet& set, DataLogFileHandler* log, PkvWriter writer) {
  PkvSet valid = set;
  std::erase_if(valid.items, [](const PkvNvItem& item) { return item.status != 0; });
  Normalize(valid);
  if (writer == PkvWriter::kVarnPkvFile && valid.items.empty()) {
    return {PkvResult::kNoItem, path + ": not written, VARN_PkvFile holds no file without an NV item"};
  }
  try {
    if (writer == PkvWriter::kVarnPkvFile) {
      WriteWithVarnPkvFile(path, valid);
    } else {
      WriteWithStorageClasses(path, valid);
    }
  } catch (const VARN_PkvFile::Exception& exception) {
    return {PkvResult::kCannotWrite, exception.what()};
  }
  LogWritten(log, path, valid);
  return {};
}

}  // namespace kral::pkv
