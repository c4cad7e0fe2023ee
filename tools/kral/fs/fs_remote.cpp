// Calls the library and turns its results and error numbers into errors that name the path.
#include "tools/kral/fs/fs_remote.h"

#include <algorithm>
#include <utility>

#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/fs/fs_names.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/output.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kNoSuchFile = 2;
constexpr std::uint32_t kExists = 6;
constexpr const char* kStatus = "KRAL_EFS2_DIAG_STAT";
constexpr std::size_t kMostEntries = 200'000;  // of all directories that a verb lists; more is a handset gone wrong

// The callbacks carry the handle and nothing else.
thread_local RemoteFiles* current = nullptr;

RemoteEntry::Kind KindOfEntry(const KRAL_EFS_ENTRY& entry) {
  if (entry.type == KRAL_EFS_ENTRY_FILE) return RemoteEntry::Kind::kFile;
  if (entry.type == KRAL_EFS_ENTRY_LINK) return RemoteEntry::Kind::kLink;
  // Kinds that the handset alone knows are reported as directories, too.
  const auto kind = entry.mode & KRAL_EFS_MODE_KIND;
  return kind == 0 || kind == 0x4000 ? RemoteEntry::Kind::kDirectory : RemoteEntry::Kind::kOther;
}

}  // namespace

bool ConcernsOneFile(const ToolError& error) {
  return error.code() == ExitCode::kRefused || error.code() == ExitCode::kBadFile ||
         error.code() == ExitCode::kSafetyStop || error.code() == ExitCode::kUsage;
}

bool RemoteStatus::is_directory() const {
  return (mode & KRAL_EFS_MODE_KIND) == 0x4000;
}
RemoteEntry::Kind RemoteStatus::kind() const {
  const auto kind = mode & KRAL_EFS_MODE_KIND;
  if (is_directory()) return RemoteEntry::Kind::kDirectory;
  return is_item() || kind == 0x8000 || kind == 0 ? RemoteEntry::Kind::kFile : RemoteEntry::Kind::kOther;
}
bool RemoteStatus::is_item() const {
  return (mode & KRAL_EFS_MODE_KIND) == KRAL_EFS_MODE_ITEM_FILE;
}

RemoteFiles::RemoteFiles(const SessionOptions& options) : session_(options) {
  current = this;
  KRAL_ConfigureEfs2CallBacks(session_.handle(), &RemoteFiles::OnChunk, &RemoteFiles::OnEntry);
  interrupt_watch_.emplace(session_.handle());
}

RemoteFiles::~RemoteFiles() {
  KRAL_ConfigureEfs2CallBacks(session_.handle(), nullptr, nullptr);
  current = nullptr;
}

void KRAL_CALL RemoteFiles::OnChunk(std::uintptr_t, std::uintptr_t, std::uint32_t, std::uint32_t, std::uint32_t done,
                                    std::uint32_t, KRAL_HANDLE handle) {
  if (Interrupted()) KRAL_AbortEFS_Operation(handle);
  if (current != nullptr && current->watch_) current->watch_(done);
}

void KRAL_CALL RemoteFiles::OnEntry(const KRAL_EFS_ENTRY* entry, KRAL_HANDLE handle) {
  if (current == nullptr || Interrupted() || current->entry_count_ >= kMostEntries) {
    KRAL_AbortEFS_Operation(handle);
    return;
  }
  ++current->entry_count_;
  // The full path begins with the directory; what follows is the handset's, slashes included.
  std::string_view name = entry->name;
  name.remove_prefix(std::min(name.size(), JoinEfs(current->listed_, "").size()));
  if (name == "." || name == "..") return;
  current->entries_.push_back({KindOfEntry(*entry), std::string(name), entry->mode, entry->size, entry->modify_time});
}

std::string RemoteFiles::Where(std::string_view path) const {
  return Format("{} on {}", NameText(path), DescribePort(session_.port()));
}

// A call whose answer is an error number has not failed, and leaves no record: the number is told as one is.
ToolError RemoteFiles::Refusal(std::string_view what, std::string_view path, std::uint32_t error_number,
                               std::string_view function) const {
  KRAL_ERROR record{};
  function.copy(record.function, sizeof record.function - 1);
  record.code = KRAL_ERROR_REFUSED;
  record.status_kind = KRAL_ERROR_STATUS_EFS;
  record.status = error_number;
  const std::string text = error_number == kNoSuchFile && !path.empty()
                               ? Format("no such file {}", NameText(path))
                               : Format("the handset refused {}: {}", what, ErrorText(error_number));
  text.copy(record.text, sizeof record.text - 1);
  return ExplainRecord(record, what, session_.port());
}

template <class Request>
void RemoteFiles::Transfer(std::string_view what, Request&& request) {
  session_.Begin();
  if (request() == 0) throw session_.Explain(what);
}

// Of a file that is written it is the directory that is missing.
template <class Request>
void RemoteFiles::Put(std::string_view what, const std::string& path, Request&& request) {
  session_.Begin();
  if (request() != 0) return;
  const auto error = session_.Explain(what);
  if (!IsNoSuchFile(error.record())) throw error;
  for (std::size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    const auto directory = path.substr(0, end);
    if (Find(directory)) continue;
    throw ToolError(error.code(), Format("there is no directory {}", Where(directory)),
                    "kral fs mkdir --parents makes it", error.record());
  }
  throw error;
}

void RemoteFiles::Ask(std::string_view what, std::string_view path, std::string_view function,
                      const std::function<std::uint8_t(std::uint32_t*)>& request) {
  std::uint32_t error = 0;
  Transfer(what, [&] { return request(&error); });
  if (error != 0) throw Refusal(what, path, error, function);
}

std::optional<RemoteStatus> RemoteFiles::Find(const std::string& path) {
  RemoteStatus status;
  std::uint32_t error = 0;
  const auto what = Format("the status of {}", NameText(path));
  Transfer(what, [&] {
    return KRAL_EFS2_DIAG_STAT(session_.handle(), path.c_str(), &error, &status.mode, &status.size, &status.links,
                               &status.accessed, &status.modified, &status.changed);
  });
  if (error == kNoSuchFile) return std::nullopt;
  if (error != 0) throw Refusal(what, path, error, kStatus);
  return status;
}

RemoteStatus RemoteFiles::Status(const std::string& path) {
  if (const auto status = Find(path)) return *status;
  throw Refusal(Format("the status of {}", NameText(path)), path, kNoSuchFile, kStatus);
}

std::vector<RemoteEntry> RemoteFiles::List(const std::string& path) {
  listed_ = path;
  entries_.clear();
  const auto what = Format("the listing of {}", NameText(path));
  session_.Begin();
  if (KRAL_EfsDirectory(session_.handle(), path.c_str(), KRAL_EFS_FILTER_ALL, nullptr, nullptr) == 0) {
    if (Interrupted() || entry_count_ < kMostEntries) throw session_.Explain(what);
    throw ToolError(
        ExitCode::kLink,
        Format("{} on {} does not end: {} entries so far", what, DescribePort(session_.port()), entry_count_),
        "a handset that gives entries without end needs a restart; list its directories one by one");
  }
  std::ranges::sort(entries_, [](const RemoteEntry& left, const RemoteEntry& right) { return left.name < right.name; });
  return std::move(entries_);
}

void RemoteFiles::MakeDirectory(const std::string& path) {
  const auto what = Format("the making of directory {}", NameText(path));
  std::uint32_t error = 0;
  session_.Begin();
  if (KRAL_EfsMkDir(session_.handle(), path.c_str(), &error) == 0) {
    throw error != 0 ? Refusal(what, {}, error, "KRAL_EfsMkDir") : session_.Explain(what);
  }
  // The handset says the same of a file in the way.
  if (error == kExists && !Status(path).is_directory()) throw Refusal(what, path, kExists, "KRAL_EfsMkDir");
}

void RemoteFiles::MakeParents(const std::string& path) {
  for (std::size_t end = path.find('/', 1); end != std::string::npos; end = path.find('/', end + 1)) {
    MakeDirectory(path.substr(0, end));
  }
  if (path != "/") MakeDirectory(path);
}

void RemoteFiles::ReadInto(const std::string& local, const std::string& path) {
  Transfer(Format("reading {}", NameText(path)),
           [&] { return KRAL_EfsRead(session_.handle(), local.c_str(), path.c_str()); });
}

Bytes RemoteFiles::ReadAll(const std::string& path, std::uint32_t size) {
  Bytes bytes(size);
  Transfer(Format("reading {}", NameText(path)),
           [&] { return KRAL_EfsReadMem(session_.handle(), path.c_str(), bytes.data(), &size); });
  bytes.resize(size);
  return bytes;
}

void RemoteFiles::Write(const std::string& path, std::span<const std::uint8_t> bytes) {
  Put(Format("writing {}", NameText(path)), path, [&] {
    return KRAL_EfsWriteMem(session_.handle(), bytes.data(), static_cast<std::uint32_t>(bytes.size()), path.c_str());
  });
}

void RemoteFiles::WriteItem(const std::string& path, std::span<const std::uint8_t> bytes) {
  if (bytes.size() > KRAL_EFS_ITEM_SIZE) {
    throw ToolError(ExitCode::kBadFile, Format("{} bytes are too many for the item file {}", bytes.size(), Where(path)),
                    Format("an item file holds {} bytes; remove it first to put an ordinary file in its place",
                           KRAL_EFS_ITEM_SIZE));
  }
  Put(Format("writing the item {}", NameText(path)), path, [&] {
    return KRAL_EfsPutItemFromMem(session_.handle(), path.c_str(), bytes.data(),
                                  static_cast<std::uint32_t>(bytes.size()));
  });
}

}  // namespace kral::tool
