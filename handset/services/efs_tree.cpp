// The tree itself: finding, making, removing and moving nodes, and the room that their data takes.
#include "handset/services/efs_tree.h"

#include <algorithm>
#include <deque>

namespace kral::handset {
namespace {

constexpr int kMostLinks = 8;  // followed on the way to one node

uint64_t BlocksOf(uint64_t size) {
  return (size + EfsTree::kBlockSize - 1) / EfsTree::kBlockSize;
}

// The names of a path; empty ones and "." lead nowhere.
std::deque<std::string> NamesOf(std::string_view path) {
  std::deque<std::string> names;
  while (!path.empty()) {
    const size_t end = std::min(path.find('/'), path.size());
    const std::string_view name = path.substr(0, end);
    if (!name.empty() && name != ".") names.emplace_back(name);
    path.remove_prefix(std::min(end + 1, path.size()));
  }
  return names;
}

EfsTree::Place Nowhere(EfsError error) {
  EfsTree::Place place;
  place.error = error;
  return place;
}

bool Contains(const EfsNode& node, const EfsNode& wanted) {
  if (&node == &wanted) return true;
  return std::ranges::any_of(node.children, [&](const auto& child) { return Contains(*child.second, wanted); });
}

}  // namespace

EfsNode::EfsNode(EfsKind node_kind, uint32_t node_permissions, std::shared_ptr<uint64_t> used_blocks)
    : kind(node_kind), permissions(node_permissions), used_blocks_(std::move(used_blocks)) {}

EfsNode::~EfsNode() {
  *used_blocks_ -= BlocksOf(data.size());
}

void EfsNode::Resize(size_t size) {
  *used_blocks_ += BlocksOf(size);
  *used_blocks_ -= BlocksOf(data.size());
  data.resize(size);
}

EfsTree::EfsTree() : root_(MakeNode(EfsKind::kDirectory, 0777)) {}

EfsNodePtr EfsTree::MakeNode(EfsKind kind, uint32_t permissions) const {
  auto node = std::make_shared<EfsNode>(kind, permissions & 0777, used_blocks_);
  node->accessed = node->modified = node->changed = now;
  return node;
}

EfsTree::Place EfsTree::Find(std::string_view path, bool follow_last) const {
  Place place;
  place.parent = place.node = root_;
  int links = 0;
  for (auto names = NamesOf(path); !names.empty();) {
    if (!place.node) return Nowhere(EfsError::kNotFound);
    if (place.node->kind != EfsKind::kDirectory) return Nowhere(EfsError::kNotDirectory);
    const std::string name = std::move(names.front());
    names.pop_front();
    if (name.size() > kLongestName) return Nowhere(EfsError::kNameTooLong);
    place.parent = place.node;
    place.name = name;
    const auto child = place.parent->children.find(name);
    place.node = child == place.parent->children.end() ? nullptr : child->second;
    if (place.node && place.node->kind == EfsKind::kLink && (follow_last || !names.empty())) {
      if (++links > kMostLinks) return Nowhere(EfsError::kTooManyLinks);
      const std::string target = place.node->target;
      const auto target_names = NamesOf(target);
      names.insert(names.begin(), target_names.begin(), target_names.end());
      place.node = target.starts_with('/') ? root_ : place.parent;
    }
  }
  if (!place.node) place.error = EfsError::kNotFound;
  return place;
}

EfsError EfsTree::Create(std::string_view path, EfsKind kind, uint32_t permissions, EfsNodePtr* created) {
  const Place place = Find(path, false);
  if (place.node) return EfsError::kExists;
  if (!place.parent || place.name.empty()) return place.error;
  if (!place.parent->Permits(kOwnerWrites)) return EfsError::kNoAccess;
  auto node = MakeNode(kind, permissions);
  place.parent->children[place.name] = node;
  Touch(*place.parent);
  if (created != nullptr) *created = std::move(node);
  return EfsError::kDone;
}

EfsError EfsTree::Unlink(std::string_view path) {
  const Place place = Find(path, false);
  if (!place.node) return place.error;
  if (place.node->kind == EfsKind::kDirectory) return EfsError::kIsDirectory;
  if (!place.parent->Permits(kOwnerWrites)) return EfsError::kNoAccess;
  place.parent->children.erase(place.name);
  Touch(*place.parent);
  return EfsError::kDone;
}

EfsError EfsTree::RemoveDirectory(std::string_view path) {
  const Place place = Find(path, false);
  if (!place.node) return place.error;
  if (place.node->kind != EfsKind::kDirectory) return EfsError::kNotDirectory;
  if (place.node == root_) return EfsError::kInvalid;
  if (!place.node->children.empty()) return EfsError::kNotEmpty;
  if (!place.parent->Permits(kOwnerWrites)) return EfsError::kNoAccess;
  place.parent->children.erase(place.name);
  Touch(*place.parent);
  return EfsError::kDone;
}

EfsError EfsTree::Rename(std::string_view from, std::string_view to) {
  const Place source = Find(from, false);
  if (!source.node) return source.error;
  const Place target = Find(to, false);
  if (!target.parent || target.name.empty()) return target.node ? EfsError::kInvalid : target.error;
  if (source.node == root_ || Contains(*source.node, *target.parent)) return EfsError::kInvalid;
  if (!source.parent->Permits(kOwnerWrites) || !target.parent->Permits(kOwnerWrites)) return EfsError::kNoAccess;
  if (target.node == source.node) return EfsError::kDone;
  if (target.node && target.node->kind == EfsKind::kDirectory) return EfsError::kExists;
  source.parent->children.erase(source.name);
  target.parent->children[target.name] = source.node;
  Touch(*source.parent);
  Touch(*target.parent);
  return EfsError::kDone;
}

EfsError EfsTree::ChangeMode(std::string_view path, uint32_t permissions) {
  const Place place = Find(path);
  if (!place.node) return place.error;
  place.node->permissions = permissions & 0777;
  place.node->changed = now;
  return EfsError::kDone;
}

EfsError EfsTree::Write(EfsNode& node, size_t offset, ByteView bytes) {
  // Offsets are the host's: on a 32-bit machine their sum with a size would wrap.
  const uint64_t end = std::max<uint64_t>(node.data.size(), uint64_t{offset} + bytes.size());
  if (BlocksOf(end) - BlocksOf(node.data.size()) > free_blocks()) return EfsError::kNoSpace;
  node.Resize(static_cast<size_t>(end));
  std::ranges::copy(bytes, node.data.begin() + static_cast<std::ptrdiff_t>(offset));
  Touch(node);
  return EfsError::kDone;
}

void EfsTree::Truncate(EfsNode& node) {
  node.Resize(0);
  Touch(node);
}

uint32_t EfsTree::Count(const EfsNode& node) {
  uint32_t count = 0;
  for (const auto& [name, child] : node.children) count += 1 + Count(*child);
  return count;
}

}  // namespace kral::handset
