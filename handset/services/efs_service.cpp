// The requests that move file contents, and the model behind all of them. Requests on names and the file system are in
// efs_service_names.cpp.
#include "handset/services/efs_service.h"

#include <algorithm>

#include "handset/services/efs_wire.h"

namespace kral::handset {
namespace {

constexpr uint32_t kAccessMode = 3;  // of the open flags: 0 read, 1 write, 2 both
constexpr uint32_t kCreate = 0x40;
constexpr uint32_t kTruncate = 0x200;
constexpr uint32_t kOwnerReads = 0400;
constexpr size_t kItemSize = 1024;

template <class Map>
uint32_t LowestFree(const Map& map) {
  uint32_t free = 0;
  while (map.contains(free)) ++free;
  return free;
}

bool IsReadable(uint32_t flags) {
  return (flags & kAccessMode) != 1;
}

bool IsWritable(uint32_t flags) {
  return (flags & kAccessMode) != 0;
}

}  // namespace

void EfsService::Register(RequestTable& table) {
  RegisterFiles(table);
  RegisterDirectories(table);
  RegisterNames(table);
  RegisterItems(table);
  RegisterSystem(table);
}

void EfsService::AddRequest(RequestTable& table, uint16_t command, size_t least,
                            std::function<Bytes(ByteView)> answer) {
  table.OnSubsystem(efs::kSubsystem, command, Length::AtLeast(least),
                    [this, answer = std::move(answer)](ByteView request, Wire& wire) {
                      Bytes reply;
                      {
                        const std::lock_guard lock(mutex_);
                        reply = answer(request);
                      }
                      // An empty reply stands for a request that cannot be read.
                      if (reply.empty()) return Refuse(Refusal::kBadParameter, request, wire);
                      wire.Send(reply);
                    });
}

void EfsService::RegisterFiles(RequestTable& table) {
  AddRequest(table, 2, 13, [this](ByteView request) { return Open(request); });
  AddRequest(table, 3, 8, [this](ByteView request) {
    const bool closed = descriptors_.erase(GetU32(request, 4)) > 0;
    return efs::ErrorReply(request, closed ? EfsError::kDone : EfsError::kBadDescriptor);
  });
  AddRequest(table, 4, 16, [this](ByteView request) { return Read(request); });
  AddRequest(table, 5, 12, [this](ByteView request) { return Write(request); });
}

EfsError EfsService::OpenNode(const std::string& path, uint32_t flags, uint32_t permissions, EfsNodePtr& node) {
  if (descriptors_.size() >= most_descriptors_) return EfsError::kTooManyOpen;
  const EfsTree::Place place = tree_.Find(path);
  node = place.node;
  if (!node) {
    if (place.error != EfsError::kNotFound || (flags & kCreate) == 0) return place.error;
    return tree_.Create(path, EfsKind::kFile, permissions, &node);
  }
  if (node->kind == EfsKind::kDirectory) return EfsError::kIsDirectory;
  if (node->kind == EfsKind::kItemFile && (!opens_item_files_ || IsWritable(flags))) return EfsError::kInvalid;
  if (IsReadable(flags) && !node->Permits(kOwnerReads)) return EfsError::kNoAccess;
  if (IsWritable(flags) && !node->Permits(kOwnerWrites)) return EfsError::kNoAccess;
  if (IsWritable(flags) && (flags & kTruncate) != 0) tree_.Truncate(*node);
  return EfsError::kDone;
}

Bytes EfsService::Open(ByteView request) {
  const auto path = efs::TextAt(request, 12);
  if (!path) return {};
  const uint32_t flags = GetU32(request, 4);
  EfsNodePtr node;
  const EfsError error = OpenNode(*path, flags, GetU32(request, 8), node);
  uint32_t descriptor = UINT32_MAX;
  if (error == EfsError::kDone) {
    descriptor = LowestFree(descriptors_);
    descriptors_[descriptor] = {node, flags};
  }
  return efs::Reply(request).U32(descriptor).U32(efs::Number(error)).Take();
}

Bytes EfsService::Read(ByteView request) {
  const uint32_t descriptor = GetU32(request, 4);
  const uint32_t offset = GetU32(request, 12);
  const auto file = descriptors_.find(descriptor);
  EfsError error = EfsError::kDone;
  ByteView data;
  if (file == descriptors_.end() || !IsReadable(file->second.flags)) {
    error = EfsError::kBadDescriptor;
  } else {
    EfsNode& node = *file->second.node;
    const ByteView all = node.data;
    const size_t begin = std::min<size_t>(offset, all.size());
    data = all.subspan(begin, std::min({size_t{GetU32(request, 8)}, all.size() - begin, read_limit_}));
    node.accessed = tree_.now;
  }
  return efs::Reply(request)
      .U32(descriptor)
      .U32(offset)
      .U32(static_cast<uint32_t>(data.size()))
      .U32(efs::Number(error))
      .Raw(data)
      .Take();
}

Bytes EfsService::Write(ByteView request) {
  const uint32_t descriptor = GetU32(request, 4);
  const uint32_t offset = GetU32(request, 8);
  const ByteView sent = request.subspan(12);
  const ByteView data = sent.first(std::min(sent.size(), write_limit_));
  const auto file = descriptors_.find(descriptor);
  EfsError error = EfsError::kBadDescriptor;
  if (file != descriptors_.end() && IsWritable(file->second.flags)) {
    Bytes& kept = file->second.node->data;
    error = tree_.Write(*file->second.node, offset, data);
    if (error == EfsError::kDone && bad_offset_ && *bad_offset_ >= offset && *bad_offset_ - offset < data.size()) {
      kept[*bad_offset_] ^= 0xFF;
    }
  }
  const auto written = error == EfsError::kDone ? static_cast<uint32_t>(data.size()) : 0;
  return efs::Reply(request).U32(descriptor).U32(offset).U32(written).U32(efs::Number(error)).Take();
}

void EfsService::RegisterItems(RequestTable& table) {
  AddRequest(table, 38, 15, [this](ByteView request) { return PutItem(request); });
  AddRequest(table, 39, 15, [this](ByteView request) { return GetItem(request); });
}

Bytes EfsService::PutItem(ByteView request) {
  const uint32_t size = GetU32(request, 4);
  if (size > request.size() - 14) return {};
  const auto path = efs::TextAt(request, 14 + size);
  if (!path) return {};
  EfsError error = size > kItemSize ? EfsError::kTooLarge : EfsError::kDone;
  const auto place = tree_.Find(*path);
  EfsNodePtr node = place.node;
  if (error == EfsError::kDone && node && node->kind != EfsKind::kItemFile) {
    error = node->kind == EfsKind::kDirectory ? EfsError::kIsDirectory : EfsError::kExists;
  }
  const bool is_new = !node;
  if (error == EfsError::kDone && is_new) error = tree_.Create(*path, EfsKind::kItemFile, 0666, &node);
  if (error == EfsError::kDone && !node->Permits(kOwnerWrites)) error = EfsError::kNoAccess;
  if (error == EfsError::kDone) {
    const Bytes before = node->data;
    tree_.Truncate(*node);
    error = tree_.Write(*node, 0, request.subspan(14, size));
    if (error != EfsError::kDone && is_new) tree_.Unlink(*path);
    if (error != EfsError::kDone && !is_new) tree_.Write(*node, 0, before);
  }
  return efs::Reply(request).U16(GetU16(request, 12)).U32(efs::Number(error)).Take();
}

Bytes EfsService::GetItem(ByteView request) const {
  const auto path = efs::TextAt(request, 14);
  if (!path || path->size() + 1 != GetU32(request, 8)) return {};
  const auto place = tree_.Find(*path);
  EfsError error = place.error;
  ByteView data;
  if (place.node && place.node->kind == EfsKind::kDirectory) {
    error = EfsError::kIsDirectory;
  } else if (place.node && !place.node->Permits(kOwnerReads)) {
    error = EfsError::kNoAccess;
  } else if (place.node) {
    data = place.node->data;
    data = data.first(std::min<size_t>({data.size(), GetU32(request, 4), kItemSize}));
  }
  return efs::Reply(request)
      .U32(static_cast<uint32_t>(data.size()))
      .U32(efs::Number(error))
      .U16(GetU16(request, 12))
      .Raw(data)
      .Take();
}

void EfsService::OnReset() {
  const std::lock_guard lock(mutex_);
  descriptors_.clear();
  directories_.clear();
}

void EfsService::AddNode(std::string_view path, EfsKind kind, uint32_t permissions, ByteView data, std::string target) {
  const std::lock_guard lock(mutex_);
  for (size_t end = path.find('/', 1); end != std::string_view::npos; end = path.find('/', end + 1)) {
    tree_.Create(path.substr(0, end), EfsKind::kDirectory, 0777);
  }
  if (kind != EfsKind::kDirectory) tree_.Unlink(path);
  EfsNodePtr node;
  if (tree_.Create(path, kind, permissions, &node) != EfsError::kDone) return;
  node->Resize(data.size());
  std::ranges::copy(data, node->data.begin());
  node->target = std::move(target);
}

void EfsService::AddFile(std::string_view path, ByteView data, uint32_t permissions) {
  AddNode(path, EfsKind::kFile, permissions, data, "");
}

void EfsService::AddItemFile(std::string_view path, ByteView data) {
  AddNode(path, EfsKind::kItemFile, 0644, data, "");
}

void EfsService::AddDirectory(std::string_view path, uint32_t permissions) {
  AddNode(path, EfsKind::kDirectory, permissions, {}, "");
}

void EfsService::AddLink(std::string_view path, std::string target) {
  AddNode(path, EfsKind::kLink, 0777, {}, std::move(target));
}

std::optional<Bytes> EfsService::File(std::string_view path) const {
  const std::lock_guard lock(mutex_);
  const auto place = tree_.Find(path);
  if (!place.node || place.node->kind == EfsKind::kDirectory) return std::nullopt;
  return place.node->data;
}

std::optional<uint32_t> EfsService::Mode(std::string_view path) const {
  const std::lock_guard lock(mutex_);
  const auto place = tree_.Find(path, false);
  return place.node ? std::optional(place.node->mode()) : std::nullopt;
}

uint32_t EfsService::used_blocks() const {
  const std::lock_guard lock(mutex_);
  return tree_.used_blocks();
}

void EfsService::SetTotalBlocks(uint32_t blocks) {
  const std::lock_guard lock(mutex_);
  tree_.total_blocks = blocks;
}

void EfsService::SetLimits(size_t descriptors, size_t directories) {
  const std::lock_guard lock(mutex_);
  most_descriptors_ = descriptors;
  most_directories_ = directories;
}

size_t EfsService::open_descriptors() const {
  const std::lock_guard lock(mutex_);
  return descriptors_.size();
}

size_t EfsService::open_directories() const {
  const std::lock_guard lock(mutex_);
  return directories_.size();
}

void EfsService::OpenItemFiles(bool open) {
  const std::lock_guard lock(mutex_);
  opens_item_files_ = open;
}

void EfsService::SetWriteLimit(size_t bytes) {
  const std::lock_guard lock(mutex_);
  write_limit_ = bytes;
}

void EfsService::SetReadLimit(size_t bytes) {
  const std::lock_guard lock(mutex_);
  read_limit_ = bytes;
}

void EfsService::SetBadOffset(uint32_t offset) {
  const std::lock_guard lock(mutex_);
  bad_offset_ = offset;
}

void EfsService::ShowNameAs(std::string name, std::string shown) {
  const std::lock_guard lock(mutex_);
  shown_names_[std::move(name)] = std::move(shown);
}

void EfsService::SetSyncPolls(uint32_t polls) {
  const std::lock_guard lock(mutex_);
  sync_polls_ = polls;
}

}  // namespace kral::handset
