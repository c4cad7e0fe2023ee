// The requests on names, directories, status and the file system as a whole.
#include <algorithm>

#include "handset/services/efs_service.h"
#include "handset/services/efs_wire.h"

namespace kral::handset {
namespace {

uint32_t EntryType(EfsKind kind) {
  switch (kind) {
    case EfsKind::kDirectory:
      return 1;
    case EfsKind::kLink:
      return 2;
    default:
      return 0;
  }
}

}  // namespace

void EfsService::AddPathRequest(RequestTable& table, uint16_t command,
                                std::function<EfsError(const std::string& path)> answer) {
  AddRequest(table, command, 5, [answer = std::move(answer)](ByteView request) {
    const auto path = efs::TextAt(request, 4);
    return path ? efs::ErrorReply(request, answer(*path)) : Bytes();
  });
}

void EfsService::RegisterNames(RequestTable& table) {
  AddRequest(table, 6, 6, [this](ByteView request) {
    const auto target = efs::TextAt(request, 4);
    const auto link = target ? efs::TextAt(request, 5 + target->size()) : std::nullopt;
    if (!link) return Bytes();
    EfsNodePtr node;
    const EfsError error = tree_.Create(*link, EfsKind::kLink, 0777, &node);
    if (node) node->target = *target;
    return efs::ErrorReply(request, error);
  });
  AddRequest(table, 7, 5, [this](ByteView request) {
    const auto path = efs::TextAt(request, 4);
    if (!path) return Bytes();
    const auto place = tree_.Find(*path, false);
    const bool is_link = place.node && place.node->kind == EfsKind::kLink;
    const EfsError error = is_link ? EfsError::kDone : place.node ? EfsError::kInvalid : place.error;
    return efs::Reply(request).U32(efs::Number(error)).Terminated(is_link ? place.node->target : "").Take();
  });
  AddPathRequest(table, 8, [this](const std::string& path) { return tree_.Unlink(path); });
  AddRequest(table, 14, 6, [this](ByteView request) {
    const auto from = efs::TextAt(request, 4);
    const auto to = from ? efs::TextAt(request, 5 + from->size()) : std::nullopt;
    return to ? efs::ErrorReply(request, tree_.Rename(*from, *to)) : Bytes();
  });
  AddRequest(table, 15, 5, [this](ByteView request) { return Stat(request); });
  AddRequest(table, 18, 7, [this](ByteView request) {
    const auto path = efs::TextAt(request, 6);
    return path ? efs::ErrorReply(request, tree_.ChangeMode(*path, GetU16(request, 4))) : Bytes();
  });
  AddRequest(table, 20, 7, [this](ByteView request) {
    const auto path = efs::TextAt(request, 6);
    if (!path) return Bytes();
    const auto place = tree_.Find(*path);
    const bool denied = place.node && !place.node->Permits(GetU16(request, 4));
    return efs::ErrorReply(request, denied ? EfsError::kNoAccess : place.error);
  });
}

Bytes EfsService::Stat(ByteView request) const {
  const auto path = efs::TextAt(request, 4);
  if (!path) return {};
  const auto place = tree_.Find(*path);
  ByteWriter reply = efs::Reply(request);
  reply.U32(efs::Number(place.error));
  if (!place.node) return reply.Raw(Bytes(24)).Take();
  const EfsNode& node = *place.node;
  return reply.U32(node.mode()).U32(node.size()).U32(1).U32(node.accessed).U32(node.modified).U32(node.changed).Take();
}

void EfsService::RegisterDirectories(RequestTable& table) {
  AddRequest(table, 9, 7, [this](ByteView request) {
    const auto path = efs::TextAt(request, 6);
    if (!path) return Bytes();
    return efs::ErrorReply(request, tree_.Create(*path, EfsKind::kDirectory, GetU16(request, 4)));
  });
  AddPathRequest(table, 10, [this](const std::string& path) { return tree_.RemoveDirectory(path); });
  AddRequest(table, 11, 5, [this](ByteView request) {
    const auto path = efs::TextAt(request, 4);
    if (!path) return Bytes();
    const auto place = tree_.Find(*path);
    EfsError error = place.error;
    uint32_t handle = 0;
    if (place.node && place.node->kind != EfsKind::kDirectory) {
      error = EfsError::kNotDirectory;
    } else if (place.node && directories_.size() >= most_directories_) {
      error = EfsError::kTooManyOpen;
    } else if (place.node) {
      while (directories_.contains(++handle)) {
      }
      OpenDirectory& directory = directories_[handle];
      for (const auto& [name, node] : place.node->children) directory.push_back({name, node});
    }
    return efs::Reply(request).U32(handle).U32(efs::Number(error)).Take();
  });
  AddRequest(table, 12, 12, [this](ByteView request) { return ReadDirectory(request); });
  AddRequest(table, 13, 8, [this](ByteView request) {
    const bool closed = directories_.erase(GetU32(request, 4)) > 0;
    return efs::ErrorReply(request, closed ? EfsError::kDone : EfsError::kBadDescriptor);
  });
}

// The entry with the sequence number asked for, counted from 1: asking again gives the same one.
Bytes EfsService::ReadDirectory(ByteView request) const {
  const uint32_t handle = GetU32(request, 4);
  const uint32_t sequence = GetU32(request, 8);
  ByteWriter reply = efs::Reply(request);
  reply.U32(handle).U32(sequence);
  const auto directory = directories_.find(handle);
  if (directory == directories_.end() || sequence == 0 || sequence > directory->second.size()) {
    const bool open = directory != directories_.end();
    reply.U32(efs::Number(open ? EfsError::kDone : EfsError::kBadDescriptor));
    return reply.Raw(Bytes(24)).Terminated("").Take();
  }
  const auto& [name, node] = directory->second[sequence - 1];
  const auto shown = shown_names_.find(name);
  reply.U32(0).U32(EntryType(node->kind)).U32(node->mode()).U32(node->size());
  return reply.U32(node->accessed)
      .U32(node->modified)
      .U32(node->changed)
      .Terminated(shown == shown_names_.end() ? name : shown->second)
      .Take();
}

void EfsService::RegisterSystem(RequestTable& table) {
  AddRequest(table, 19, 5, [this](ByteView request) { return FileSystemStatus(request); });
  AddRequest(table, 21, 4, [this](ByteView request) { return DeviceInfo(request); });
  AddRequest(table, 29, 8, [this](ByteView request) { return ExtendedInfo(request); });
  AddRequest(table, 48, 5, [this](ByteView request) { return Sync(request, true); });
  AddRequest(table, 49, 5, [this](ByteView request) { return Sync(request, false); });
  AddPathRequest(table, 53, [this](const std::string& path) { return tree_.Find(path).error; });
}

Bytes EfsService::FileSystemStatus(ByteView request) const {
  const auto path = efs::TextAt(request, 4);
  if (!path) return {};
  return efs::Reply(request)
      .U32(efs::Number(tree_.Find(*path).error))
      .U32(0x56484653)  // of the file system, made up
      .U32(2)
      .U32(EfsTree::kBlockSize)
      .U32(tree_.total_blocks)
      .U32(tree_.free_blocks())
      .U32(tree_.free_blocks())
      .U32(0x7FFFFFFF)
      .U32(tree_.file_count())
      .U32(65535)
      .Take();
}

Bytes EfsService::DeviceInfo(ByteView request) const {
  const uint32_t blocks = tree_.total_blocks / (64 * 4);  // of 64 pages, 4 file-system blocks each
  return efs::Reply(request)
      .U32(0)
      .U32(blocks)
      .U32(64)
      .U32(2048)
      .U32(2112)
      .U32(0xEC)
      .U32(0xBC)
      .U32(1)
      .Terminated("VH NAND 1G")
      .Take();
}

Bytes EfsService::ExtendedInfo(ByteView request) const {
  const auto answer = extended_info_.find(GetU32(request, 4));
  ByteWriter reply = efs::Reply(request);
  if (answer == extended_info_.end()) return reply.U32(efs::Number(EfsError::kInvalid)).U32(0).U32(0).Take();
  if (const auto* number = std::get_if<uint32_t>(&answer->second)) return reply.U32(0).U32(0).U32(*number).Take();
  return reply.U32(0).U32(1).Terminated(std::get<std::string>(answer->second)).Take();
}

Bytes EfsService::Sync(ByteView request, bool begins) {
  const auto path = efs::TextAt(request, 4);
  if (!path) return {};
  if (begins) {
    polls_to_go_ = sync_polls_;
  } else if (polls_to_go_ > 0) {
    --polls_to_go_;
  }
  return efs::Reply(request).U32(efs::Number(tree_.Find(*path).error)).U32(polls_to_go_ == 0 ? 0 : 1).Take();
}

}  // namespace kral::handset
