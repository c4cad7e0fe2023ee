// The handset's file system: a tree of files, item files, directories and symbolic links in a memory of limited size.
// Not thread-safe; its service locks.
#ifndef KRAL_HANDSET_SERVICES_EFS_TREE_H
#define KRAL_HANDSET_SERVICES_EFS_TREE_H

#include <algorithm>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "handset/line/bytes.h"

namespace kral::handset {

enum class EfsError : uint32_t {
  kDone = 0,
  kNotFound = 2,
  kExists = 6,
  kBadDescriptor = 9,
  kNoAccess = 13,
  kNotDirectory = 20,
  kIsDirectory = 21,
  kInvalid = 22,
  kTooManyOpen = 24,
  kTooLarge = 27,
  kNoSpace = 28,
  kNameTooLong = 36,
  kNotEmpty = 39,
  kTooManyLinks = 40,
};

// The high bits of a mode.
enum class EfsKind : uint32_t { kDirectory = 0x4000, kFile = 0x8000, kLink = 0xA000, kItemFile = 0xE000 };

// Of the permissions.
inline constexpr uint32_t kOwnerWrites = 0200;

class EfsNode {
 public:
  EfsNode(EfsKind node_kind, uint32_t node_permissions, std::shared_ptr<uint64_t> used_blocks);
  ~EfsNode();
  EfsNode(const EfsNode&) = delete;
  EfsNode& operator=(const EfsNode&) = delete;

  uint32_t mode() const { return static_cast<uint32_t>(kind) | permissions; }
  uint32_t size() const { return static_cast<uint32_t>(kind == EfsKind::kLink ? target.size() : data.size()); }
  bool Permits(uint32_t bits) const { return (permissions & bits) == bits; }
  void Resize(size_t size);

  const EfsKind kind;
  uint32_t permissions;
  Bytes data;
  std::string target;
  std::map<std::string, std::shared_ptr<EfsNode>, std::less<>> children;
  uint32_t accessed = 0;
  uint32_t modified = 0;
  uint32_t changed = 0;

 private:
  const std::shared_ptr<uint64_t> used_blocks_;
};

using EfsNodePtr = std::shared_ptr<EfsNode>;

class EfsTree {
 public:
  static constexpr uint32_t kBlockSize = 512;
  static constexpr size_t kLongestName = 255;

  EfsTree();

  // Where a path leads. `parent` is set when all but the last name is there.
  struct Place {
    EfsError error = EfsError::kDone;
    EfsNodePtr parent;
    std::string name;
    EfsNodePtr node;
  };
  Place Find(std::string_view path, bool follow_last = true) const;

  // Each of these gives what the handset answers. A new node goes where nothing is; kExists otherwise.
  EfsError Create(std::string_view path, EfsKind kind, uint32_t permissions, EfsNodePtr* created = nullptr);
  EfsError Unlink(std::string_view path);
  EfsError RemoveDirectory(std::string_view path);
  EfsError Rename(std::string_view from, std::string_view to);
  EfsError ChangeMode(std::string_view path, uint32_t permissions);
  // All or nothing; a gap in front of the offset reads as zeros.
  EfsError Write(EfsNode& node, size_t offset, ByteView bytes);
  void Truncate(EfsNode& node);

  uint32_t total_blocks = 65536;
  uint32_t now = 1700000000;  // seconds; what changes bears this time

  uint32_t used_blocks() const { return static_cast<uint32_t>(*used_blocks_); }
  uint32_t free_blocks() const { return total_blocks - std::min(used_blocks(), total_blocks); }
  uint32_t file_count() const { return Count(*root_); }

 private:
  static uint32_t Count(const EfsNode& node);
  EfsNodePtr MakeNode(EfsKind kind, uint32_t permissions) const;
  void Touch(EfsNode& node) const { node.modified = node.changed = now; }

  std::shared_ptr<uint64_t> used_blocks_ = std::make_shared<uint64_t>(0);
  EfsNodePtr root_;
};

}  // namespace kral::handset

#endif
