// The handset's files as a host reaches them: the requests of subsystem 19 over the tree of efs_tree.h.
#ifndef KRAL_HANDSET_SERVICES_EFS_SERVICE_H
#define KRAL_HANDSET_SERVICES_EFS_SERVICE_H

#include <map>
#include <mutex>
#include <optional>
#include <variant>

#include "handset/line/request_table.h"
#include "handset/services/efs_tree.h"

namespace kral::handset {

class EfsService final : public Service {
 public:
  void Register(RequestTable& table) override;
  void OnReset() override;  // open descriptors and directories are gone; files stay

  // --- The model; folders on the way are made as needed -------------------------------------------------------------
  void AddFile(std::string_view path, ByteView data, uint32_t permissions = 0644);
  void AddItemFile(std::string_view path, ByteView data);
  void AddDirectory(std::string_view path, uint32_t permissions = 0777);
  void AddLink(std::string_view path, std::string target);
  std::optional<Bytes> File(std::string_view path) const;     // of files and item files
  std::optional<uint32_t> Mode(std::string_view path) const;  // kind and permissions; links not followed
  bool Exists(std::string_view path) const { return Mode(path).has_value(); }
  uint32_t used_blocks() const;
  void SetTotalBlocks(uint32_t blocks);

  // --- What can run out ---------------------------------------------------------------------------------------------
  void SetLimits(size_t descriptors, size_t directories);
  size_t open_descriptors() const;
  size_t open_directories() const;

  // --- Behaviour ----------------------------------------------------------------------------------------------------
  // Some handsets let item files be read as plain ones, which is the only way to one of more bytes than a request
  // takes.
  void OpenItemFiles(bool open);
  // A write takes so many bytes at most; 0 takes none and tells no error.
  void SetWriteLimit(size_t bytes);
  void SetReadLimit(size_t bytes);  // an answer has so many bytes of a file at most
  // Worn memory: files keep a wrong byte at this offset.
  void SetBadOffset(uint32_t offset);
  // A handset that is not to be trusted: its listings show one name as another.
  void ShowNameAs(std::string name, std::string shown);
  // A sync is reported done with the n-th status request; 0: at once.
  void SetSyncPolls(uint32_t polls);

 private:
  struct OpenFile {
    EfsNodePtr node;
    uint32_t flags;
  };
  struct Entry {
    std::string name;
    EfsNodePtr node;
  };
  using OpenDirectory = std::vector<Entry>;  // as it was when opened

  void RegisterFiles(RequestTable& table);
  void RegisterDirectories(RequestTable& table);
  void RegisterNames(RequestTable& table);
  void RegisterItems(RequestTable& table);
  void RegisterSystem(RequestTable& table);

  Bytes Open(ByteView request);
  Bytes Read(ByteView request);
  Bytes Write(ByteView request);
  Bytes ReadDirectory(ByteView request) const;
  Bytes PutItem(ByteView request);
  Bytes GetItem(ByteView request) const;
  Bytes Stat(ByteView request) const;
  Bytes FileSystemStatus(ByteView request) const;
  Bytes DeviceInfo(ByteView request) const;
  Bytes ExtendedInfo(ByteView request) const;
  Bytes Sync(ByteView request, bool begins);

  EfsError OpenNode(const std::string& path, uint32_t flags, uint32_t permissions, EfsNodePtr& node);
  void AddNode(std::string_view path, EfsKind kind, uint32_t permissions, ByteView data, std::string target);
  void AddRequest(RequestTable& table, uint16_t command, size_t least, std::function<Bytes(ByteView)> answer);
  // A request that carries one path and is answered by an error number.
  void AddPathRequest(RequestTable& table, uint16_t command, std::function<EfsError(const std::string& path)> answer);

  mutable std::mutex mutex_;
  EfsTree tree_;
  std::map<uint32_t, OpenFile> descriptors_;
  std::map<uint32_t, OpenDirectory> directories_;
  size_t most_descriptors_ = 16;
  size_t most_directories_ = 4;
  bool opens_item_files_ = false;
  size_t write_limit_ = SIZE_MAX;
  size_t read_limit_ = SIZE_MAX;
  std::optional<uint32_t> bad_offset_;
  std::map<std::string, std::string> shown_names_;
  uint32_t sync_polls_ = 0;
  uint32_t polls_to_go_ = 0;
  const std::map<uint32_t, std::variant<uint32_t, std::string>> extended_info_ = {{0, 255u},
                                                                                  {1, std::string("VHFS 2.1")}};
};

}  // namespace kral::handset

#endif
