// Lists a directory of the handset, entry by entry.
#include <cstring>

#include "base/outputs.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_handle.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {
namespace {

constexpr u32 kMostEntries = 1'000'000;  // a listing that goes on beyond these has no end

struct Entry {
  u32 type;  // the handset's
  KRAL_EFS_ENTRY record;
  std::string name;
};

// Files and directories are deliberately swapped against the handset's numbers.
u32 ReportedType(u32 type) {
  switch (type) {
    case entry::kFile:
      return KRAL_EFS_ENTRY_FILE;
    case entry::kLink:
      return KRAL_EFS_ENTRY_LINK;
    default:
      return KRAL_EFS_ENTRY_DIRECTORY;
  }
}

bool IsSelected(u32 type, uint8_t filter) {
  if (filter == KRAL_EFS_FILTER_ALL) return true;
  return filter <= KRAL_EFS_FILTER_LINKS && type == filter;
}

// Nothing (logged) when the reply tells an error, or has a name without end.
std::optional<Entry> ParseEntry(Diag_FTM& phone, const char* folder, std::span<const u8> reply) {
  auto name = TextAt(reply, entry::kName);
  if (const u32 error = LoadLe<u32>(reply, entry::kError).value_or(kDone); !IsDone(error, folder)) {
    phone.log().WriteLine(kLogErr, "EFS Readdir error code %u", error);
    return std::nullopt;
  }
  if (!name) {
    phone.log().WriteLine(kLogErr, "EFS Readdir reply of %u bytes has no name with an end",
                          static_cast<u32>(reply.size()));
    Fail(BadReply(phone, "has no name with an end"));
    return std::nullopt;
  }
  const auto field = [&](size_t offset) { return *LoadLe<u32>(reply, offset); };
  Entry result{.type = field(entry::kType), .record = {}, .name = std::move(*name)};
  result.record.type = ReportedType(result.type);
  result.record.mode = field(entry::kMode);
  result.record.size = field(entry::kSize);
  result.record.access_time = field(entry::kAccessTime);
  result.record.modify_time = field(entry::kModifyTime);
  result.record.change_time = field(entry::kChangeTime);
  return result;
}

std::optional<Entry> ReadEntry(Diag_FTM& phone, const char* folder, u32 directory, u32 sequence) {
  Compose(phone, kReadDirectory, directory, sequence);
  std::optional<Entry> read;
  const auto is_own = [&](std::span<const u8> reply) {
    return LoadLe<u32>(reply, kHandleAt) == directory && LoadLe<u32>(reply, entry::kSequence) == sequence;
  };
  ExchangeUntil(phone, PacketTimeOut(phone), is_own, [&](std::span<const u8> reply) {
    read = ParseEntry(phone, folder, reply);
    return read.has_value();
  });
  return read;
}

bool SetFullName(KRAL_EFS_ENTRY& record, const std::string& folder, const std::string& name) {
  std::string full = folder;
  if (full.back() != '/') full += '/';
  full += name;
  if (full.size() >= sizeof(record.name)) return false;
  std::memcpy(record.name, full.c_str(), full.size() + 1);
  return true;
}

// False (logged) when its name does not fit.
bool Complete(Diag_FTM& phone, const std::string& folder, Entry& entry) {
  if (SetFullName(entry.record, folder, entry.name)) return true;
  const auto size = static_cast<u32>(entry.name.size());
  phone.log().WriteLine(kLogErr, "EFS Readdir name of %u bytes does not fit behind its directory", size);
  return Fail(
      Failure(KRAL_ERROR_LINK, "an entry of %s has a name of %u bytes, which fits nowhere", folder.c_str(), size));
}

}  // namespace

bool ListEntries(Diag_FTM& phone, const std::string& folder, uint8_t filter, const EntrySink& sink) {
  const Transfer transfer(phone);
  RemoteDirectory directory(phone);
  if (!directory.Open(folder.c_str())) return false;
  for (u32 sequence = kFirstEntry;; ++sequence) {
    if (IsAborted(phone, "Readdir")) return false;
    if (sequence > kMostEntries) {
      return Fail(Failure(KRAL_ERROR_LINK, "the listing of %s has no end", folder.c_str()));
    }
    auto read = ReadEntry(phone, folder.c_str(), directory.value(), sequence);
    if (!read) {
      IsAborted(phone, "Readdir");
      return false;
    }
    if (read->name.empty()) break;
    if (!IsSelected(read->type, filter)) continue;
    if (!Complete(phone, folder, *read) || !sink(read->record)) return false;
  }
  // The entries are there: a handle that cannot be closed is logged, and no reason to withhold them.
  directory.Close();
  return true;
}

bool ListDirectory(Diag_FTM& phone, const char* folder, uint8_t filter, KRAL_EFS_ENTRY* entries, u32* count) {
  const std::string path = folder == nullptr || *folder == '\0' ? "/" : folder;
  const u32 room = entries == nullptr || count == nullptr ? 0 : *count;
  u32 selected = 0;
  const auto take = [&](const KRAL_EFS_ENTRY& entry) {
    if (selected < room) entries[selected] = entry;
    ++selected;
    TellCaller(phone, entry);
    return true;
  };
  if (!ListEntries(phone, path, filter, take)) {
    phone.log().WriteLine(kLogErr, "KRAL_EfsDirectory( sFolderPath = %s ) - Failed", path.c_str());
    return false;
  }
  Put(count, selected);
  return true;
}

}  // namespace kral::efs
