// Lists a directory of the handset, entry by entry.
#include <cstring>

#include "commands/outputs.h"
#include "frame/base/guarded_call.h"
#include "storage/efs_client.h"
#include "storage/efs_handle.h"
#include "storage/efs_request.h"

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
std::optional<Entry> ParseEntry(Diag_FTM& phone, std::span<const u8> reply) {
  auto name = TextAt(reply, entry::kName);
  if (const u32 error = LoadLe<u32>(reply, entry::kError).value_or(kDone); error != kDone) {
    phone.log().WriteLine(kLogErr, "EFS Readdir error code %u", error);
    return std::nullopt;
  }
  if (!name) {
    phone.log().WriteLine(kLogErr, "EFS Readdir reply of %u bytes has no name with an end",
                          static_cast<u32>(reply.size()));
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

std::optional<Entry> ReadEntry(Diag_FTM& phone, u32 directory, u32 sequence) {
  Compose(phone, kReadDirectory, directory, sequence);
  std::optional<Entry> read;
  const auto is_own = [&](std::span<const u8> reply) {
    return LoadLe<u32>(reply, kHandleAt) == directory && LoadLe<u32>(reply, entry::kSequence) == sequence;
  };
  ExchangeUntil(phone, PacketTimeOut(phone), is_own, [&](std::span<const u8> reply) {
    read = ParseEntry(phone, reply);
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

bool List(Diag_FTM& phone, const std::string& folder, uint8_t filter, KRAL_EFS_ENTRY* entries, u32* count) {
  RemoteDirectory directory(phone);
  if (!directory.Open(folder.c_str())) return false;
  const u32 room = entries == nullptr || count == nullptr ? 0 : *count;
  u32 selected = 0;
  for (u32 sequence = kFirstEntry;; ++sequence) {
    if (IsAborted(phone, "Readdir") || sequence > kMostEntries) return false;
    auto read = ReadEntry(phone, directory.value(), sequence);
    if (!read) {
      IsAborted(phone, "Readdir");
      return false;
    }
    if (read->name.empty()) break;
    if (!IsSelected(read->type, filter)) continue;
    if (!SetFullName(read->record, folder, read->name)) {
      phone.log().WriteLine(kLogErr, "EFS Readdir name of %u bytes does not fit behind its directory",
                            static_cast<u32>(read->name.size()));
      return false;
    }
    if (selected < room) entries[selected] = read->record;
    ++selected;
    if (const auto callback = phone.efs().directory_callback.load()) {
      CallGuarded([&] { callback(&read->record, phone.efs().callback_context); });
    }
  }
  Put(count, selected);
  // The entries are there: a handle that cannot be closed is logged, and no reason to withhold them.
  directory.Close();
  return true;
}

}  // namespace

bool ListDirectory(Diag_FTM& phone, const char* folder, uint8_t filter, KRAL_EFS_ENTRY* entries, u32* count) {
  ForgetAbort(phone);
  const std::string path = folder == nullptr || *folder == '\0' ? "/" : folder;
  if (List(phone, path, filter, entries, count)) return true;
  phone.log().WriteLine(kLogErr, "KRAL_EfsDirectory( sFolderPath = %s ) - Failed", path.c_str());
  return false;
}

}  // namespace kral::efs
