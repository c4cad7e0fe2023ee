// The files that belong to a backup: where the handset keeps them, reading them and writing them.
#include <algorithm>
#include <array>
#include <string_view>

#include "base/little_endian.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"
#include "storage/items/phone_items.h"

namespace kral::items {
namespace {

// As they stand: some are without a slash in front.
constexpr std::array<const char*, 5> kFolders = {"/nv/items", "nv/item_files/conf", "nv/reg_files/conf",
                                                 "/nv/item_files/rfnv", "nv/item_store/rfnv"};

// What a hostile handset may not exceed.
constexpr int kDeepest = 8;
constexpr uint32_t kMostEntries = 20000;  // of one folder; files in all, folders in all
constexpr uint32_t kLargestFile = 1 << 20;

// A folder's entries for itself and for the one above it.
bool IsDots(std::string_view path) {
  const std::string_view name = path.substr(path.rfind('/') + 1);
  return name == "." || name == "..";
}

}  // namespace

PhoneItems::Answer PhoneItems::Status(const char* path, uint32_t& mode, uint32_t& size, uint32_t& status) {
  efs::FileStatus found;
  const Answer answer = Try([&] { return efs::Stat(phone_, efs::Tries::kOne, path, found); });
  mode = found.mode;
  size = found.size;
  status = answer == Answer::kAnswered ? found.error_number : kRefusedStatus;
  return answer;
}

bool PhoneItems::List(const std::string& folder, std::vector<KRAL_EFS_ENTRY>& entries) {
  return efs::ListEntries(phone_, folder, KRAL_EFS_FILTER_ALL, [&](const KRAL_EFS_ENTRY& entry) {
    entries.push_back(entry);
    efs::TellCaller(phone_, entry);
    return entries.size() <= kMostEntries ||
           Fail(Failure(KRAL_ERROR_LINK, "the folder %s has too many entries", folder.c_str()));
  });
}

void PhoneItems::TellUnlisted(const std::string& folder, uint32_t status, std::vector<UnlistedFolder>& unlisted) {
  phone_.log().WriteLine(kLogErr, "Files of %s not listed, error %u", folder.c_str(), status);
  unlisted.push_back({folder, status});
}

PhoneItems::Answer PhoneItems::Walk(const std::string& path, int depth, std::vector<FoundFile>& files,
                                    std::vector<UnlistedFolder>& unlisted) {
  if (aborts_.aborted()) return Answer::kRefused;
  uint32_t mode = 0;
  uint32_t size = 0;
  uint32_t status = 0;
  const Answer answer = Status(path.c_str(), mode, size, status);
  if (answer == Answer::kLost) return answer;
  // A handset without a file system, or without this folder.
  if (answer == Answer::kRefused ? refusal_ == refusal::kCommand : status == efs::kMissing) return Answer::kAnswered;
  const uint32_t kind = mode & efs::kModeKind;
  if (status == efs::kDone && kind != efs::kFolder) {
    // Listings give entries of kinds that they do not know as folders: item files of some handsets are among them.
    if (kind == efs::kPlainFile || kind == efs::kItemFile) files.push_back({path, mode, size});
    return Answer::kAnswered;
  }
  if (status != efs::kDone || depth > kDeepest || ++walked_ > kMostEntries) {
    if (answer == Answer::kAnswered && efs::IsDone(status, path.c_str())) {
      Fail(Failure(KRAL_ERROR_LINK, "%s lies too deep, or behind too many folders", path.c_str()));
    }
    TellUnlisted(path, status != efs::kDone ? status : kRefusedStatus, unlisted);
    return Answer::kAnswered;
  }
  std::vector<KRAL_EFS_ENTRY> entries;
  if (!List(path, entries)) {
    if (aborts_.aborted()) return Answer::kRefused;
    if (Unanswered() == Answer::kLost) return Answer::kLost;
    TellUnlisted(path, kRefusedStatus, unlisted);
    return Answer::kAnswered;
  }
  for (const KRAL_EFS_ENTRY& entry : entries) {
    if (files.size() >= kMostEntries) {
      Fail(Failure(KRAL_ERROR_LINK, "there are too many files, in %s among others", path.c_str()));
      TellUnlisted(path, kRefusedStatus, unlisted);
      return Answer::kAnswered;
    }
    if (IsDots(entry.name)) continue;
    if (entry.type == KRAL_EFS_ENTRY_FILE) {
      files.push_back({entry.name, entry.mode, entry.size});
    } else if (entry.type == KRAL_EFS_ENTRY_DIRECTORY &&
               Walk(entry.name, depth + 1, files, unlisted) == Answer::kLost) {
      return Answer::kLost;
    }
  }
  return Answer::kAnswered;
}

PhoneItems::Answer PhoneItems::FindFiles(std::vector<FoundFile>& files, std::vector<UnlistedFolder>& unlisted) {
  walked_ = 0;
  for (const char* folder : kFolders) {
    if (Walk(folder, 1, files, unlisted) == Answer::kLost) return Answer::kLost;
  }
  return aborts_.aborted() ? Answer::kRefused : Answer::kAnswered;
}

PhoneItems::Answer PhoneItems::FindFiles(std::vector<FoundFile>& files) {
  std::vector<UnlistedFolder> unlisted;
  const Answer answer = FindFiles(files, unlisted);
  return answer == Answer::kAnswered && !unlisted.empty() ? Answer::kRefused : answer;
}

PhoneItems::Answer PhoneItems::ReadItemFile(pkv::PkvEfsFile& file, uint32_t& status) {
  const Answer answer = Try([&] {
    status = efs::kDone;
    return efs::GetItem(phone_, efs::Tries::kOne, file.path.c_str(), KRAL_EFS_ITEM_SIZE, file.bytes, status);
  });
  if (answer != Answer::kAnswered || status != efs::kDone || file.bytes.size() < KRAL_EFS_ITEM_SIZE) return answer;
  // All that a request takes; there may be more.
  uint32_t mode = 0;
  uint32_t size = 0;
  const Answer sized = Status(file.path.c_str(), mode, size, status);
  return sized == Answer::kAnswered && status == efs::kDone && size > KRAL_EFS_ITEM_SIZE
             ? ReadPlainFile(file, size, status)
             : sized;
}

PhoneItems::Answer PhoneItems::ReadPlainFile(pkv::PkvEfsFile& file, uint32_t size, uint32_t& status) {
  status = efs::kDone;
  if (size > kLargestFile) {
    Fail(Failure(KRAL_ERROR_LINK, "the file %s has %u bytes, more than are kept", file.path.c_str(), size));
    return Answer::kRefused;
  }
  file.bytes.resize(size);
  if (efs::ReadPlainFile(phone_, file.path.c_str(), file.bytes.data(), &size)) {
    file.bytes.resize(size);
    return Answer::kAnswered;
  }
  if (aborts_.aborted()) return Answer::kLost;
  const KeepFailure keep;
  uint32_t mode = 0;
  // Lost, or only not to be had: a handset that still answers tells.
  return Status(file.path.c_str(), mode, size, status) == Answer::kLost ? Answer::kLost : Answer::kRefused;
}

PhoneItems::Answer PhoneItems::ReadTold(pkv::PkvEfsFile& file, uint32_t size, uint32_t& status) {
  file.bytes.clear();
  const bool item = file.is_item_file() && size <= KRAL_EFS_ITEM_SIZE;
  const Answer answer = item ? ReadItemFile(file, status) : ReadPlainFile(file, size, status);
  if (answer != Answer::kAnswered) status = kRefusedStatus;
  return answer;
}

PhoneItems::Answer PhoneItems::ReadPresent(pkv::PkvEfsFile& file, uint32_t& status) {
  uint32_t size = 0;
  const Answer told = Status(file.path.c_str(), file.mode, size, status);
  return told == Answer::kAnswered && status == efs::kDone ? ReadTold(file, size, status) : told;
}

void PhoneItems::MakeFolders(const std::string& path) {
  for (size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    const std::string folder = path.substr(0, end);
    if (folders_.contains(folder)) continue;
    uint32_t error = 0;
    const Answer answer = Try([&] { return efs::MakeDirectory(phone_, folder.c_str(), error); });
    if (answer == Answer::kAnswered && (error == efs::kDone || error == efs::kExists)) folders_.insert(folder);
    if (answer == Answer::kLost) return;
  }
}

PhoneItems::Answer PhoneItems::WriteItemFile(const pkv::PkvEfsFile& file, uint32_t& status) {
  return Try([&] {
    status = efs::kDone;
    return efs::PutItem(phone_, file.path.c_str(), file.bytes, status);
  });
}

PhoneItems::Answer PhoneItems::WritePlainFile(const pkv::PkvEfsFile& file, uint32_t& status) {
  status = efs::kDone;
  if (efs::WriteMemory(phone_, file.bytes, file.path.c_str(), {})) return Answer::kAnswered;
  const KeepFailure keep;
  uint32_t mode = 0;
  uint32_t present = 0;
  return Status(file.path.c_str(), mode, present, status) == Answer::kLost ? Answer::kLost : Answer::kRefused;
}

PhoneItems::Answer PhoneItems::WriteFile(const pkv::PkvEfsFile& file, uint32_t& status) {
  MakeFolders(file.path);
  const bool item = file.is_item_file() && file.bytes.size() <= KRAL_EFS_ITEM_SIZE;
  const Answer answer = item ? WriteItemFile(file, status) : WritePlainFile(file, status);
  if (answer != Answer::kAnswered) status = kRefusedStatus;
  return answer;
}

PhoneItems::Answer PhoneItems::SetPermissions(const pkv::PkvEfsFile& file, uint32_t& status) {
  const auto permissions = static_cast<uint16_t>(file.permissions());
  const Answer answer = Try([&] {
    status = efs::kDone;
    return efs::ChangeMode(phone_, file.path.c_str(), permissions, &status);
  });
  if (answer != Answer::kAnswered) status = kRefusedStatus;
  if (status != efs::kDone)
    phone_.log().WriteLine(kLogErr, "%s: permissions %o refused, error %u", file.path.c_str(), permissions, status);
  return answer;
}

}  // namespace kral::items
