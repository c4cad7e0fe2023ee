// The handset's files as the verbs see them: calls of the library with errors that say what happened to which path.
#ifndef KRAL_TOOLS_FS_FS_REMOTE_H
#define KRAL_TOOLS_FS_FS_REMOTE_H

#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/abort_on_interrupt.h"
#include "tools/kral/session.h"

namespace kral::tool {

struct RemoteEntry {
  enum class Kind { kFile, kDirectory, kLink, kOther };
  Kind kind = Kind::kOther;
  std::string name;  // as the handset gave it: it may hold anything but a zero
  std::uint32_t mode = 0;
  std::uint32_t size = 0;
  std::uint32_t modified = 0;
};

struct RemoteStatus {
  std::uint32_t mode = 0;
  std::uint32_t size = 0;
  std::uint32_t links = 0;
  std::uint32_t accessed = 0;
  std::uint32_t modified = 0;
  std::uint32_t changed = 0;

  bool is_directory() const;
  bool is_item() const;
  RemoteEntry::Kind kind() const;  // never a link, which is followed
};

// Whether others may still be copied or looked at after it.
bool ConcernsOneFile(const ToolError& error);

using Bytes = std::vector<std::uint8_t>;

// One at a time: the library's callbacks know the connection only. Ctrl-C ends a transfer or listing at its next
// packet, or after the time-out of one that is not answered.
class RemoteFiles {
 public:
  // Called with the bytes moved by the transfer under way.
  using Watch = std::function<void(std::uint32_t done)>;

  explicit RemoteFiles(const SessionOptions& options);
  ~RemoteFiles();
  RemoteFiles(const RemoteFiles&) = delete;
  RemoteFiles& operator=(const RemoteFiles&) = delete;

  Session& session() { return session_; }
  std::string Where(std::string_view path) const;  // "/nv on COM7"
  void SetWatch(Watch watch) { watch_ = std::move(watch); }

  std::optional<RemoteStatus> Find(const std::string& path);  // nothing when there is no such file
  RemoteStatus Status(const std::string& path);
  std::vector<RemoteEntry> List(const std::string& path);  // by name, without "." and ".."

  // A request whose answer is an error number; `what` names it, such as "the removal of /a". `path` is what is missing
  // where there is no such file, `function` what is called.
  void Ask(std::string_view what, std::string_view path, std::string_view function,
           const std::function<std::uint8_t(std::uint32_t* error_number)>& request);
  void MakeDirectory(const std::string& path);
  void MakeParents(const std::string& path);  // and the directory itself

  void ReadInto(const std::string& local, const std::string& path);
  Bytes ReadAll(const std::string& path, std::uint32_t size);  // of a file that has this size
  void Write(const std::string& path, std::span<const std::uint8_t> bytes);
  void WriteItem(const std::string& path, std::span<const std::uint8_t> bytes);

 private:
  static void KRAL_CALL OnChunk(std::uintptr_t source, std::uintptr_t destination, std::uint32_t operation,
                                std::uint32_t reserved, std::uint32_t done, std::uint32_t total, KRAL_HANDLE handle);
  static void KRAL_CALL OnEntry(const KRAL_EFS_ENTRY* entry, KRAL_HANDLE handle);
  template <class Request>
  void Transfer(std::string_view what, Request&& request);
  template <class Request>
  void Put(std::string_view what, const std::string& path, Request&& request);
  ToolError Refusal(std::string_view what, std::string_view path, std::uint32_t error_number,
                    std::string_view function) const;

  Session session_;
  Watch watch_;
  std::string listed_;  // the directory whose entries arrive
  std::vector<RemoteEntry> entries_;
  std::size_t entry_count_ = 0;                      // of everything listed
  std::optional<AbortOnInterrupt> interrupt_watch_;  // last: it uses the connection
};

}  // namespace kral::tool

#endif
