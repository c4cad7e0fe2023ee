// Copies files of the handset to the PC, or into memory, chunk by chunk; item files in one piece.
#include <algorithm>
#include <functional>

#include "frame/base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs_handle.h"
#include "storage/efs_request.h"
#include "storage/efs_transfer.h"

namespace kral::efs {
namespace {

struct Sink {
  TransferEnds ends;
  std::function<bool()> open = {};  // once the handset's file is
  std::function<bool(std::span<const u8> bytes)> write = {};
};

bool StatExisting(Diag_FTM& phone, const char* efs_file, FileStatus& status) {
  if (!StatInTransfer(phone, efs_file, status)) return false;
  if (status.exists()) return true;
  phone.log().WriteLine(kLogErr, "EFS Read error code %d", static_cast<int>(status.error_number));
  return false;
}

// The data of one chunk, in the phone's packet buffer; nothing when it could not be had.
std::optional<std::span<const u8>> ReadChunk(Diag_FTM& phone, u32 descriptor, u32 wanted, u32 offset) {
  Compose(phone, kRead, descriptor, wanted, offset);
  u32 error = 0;
  u32 count = 0;
  const auto is_own = [&](std::span<const u8> reply) { return IsOfChunk(reply, descriptor, offset); };
  const bool accepted = ExchangeUntil(phone, DefaultTimeOut(phone), is_own, [&](std::span<const u8> reply) {
    const auto error_field = LoadLe<u32>(reply, kTransferError);
    if (!error_field) return false;
    error = *error_field;
    count = *LoadLe<u32>(reply, kTransferCount);
    return error != kDone || (count <= wanted && count <= reply.size() - kReadData);
  });
  if (!accepted) return std::nullopt;
  if (error != kDone) {
    phone.log().WriteLine(kLogErr, "EFS Read error code %d", static_cast<int>(error));
    return std::nullopt;
  }
  return phone.packet().response().subspan(kReadData, count);
}

// False also when the transfer was aborted, and when the file turned out shorter than the handset told.
bool ReadChunks(Diag_FTM& phone, u32 descriptor, u32 total, const Sink& sink) {
  const u16 packet_size = phone.efs().read_packet_size;
  const u32 wanted = packet_size - std::min<u32>(packet_size, kReadOverhead);
  // A larger size works for files that do not fill a packet.
  if (wanted == 0 || kReadOverhead + std::min(wanted, total) > kLongestReply) {
    phone.log().WriteLine(kLogErr, "EFS Read packet size %d cannot be used", packet_size);
    return false;
  }
  u32 offset = 0;
  for (bool full = true; full;) {
    if (IsAborted(phone, "Read")) return false;
    const auto chunk = ReadChunk(phone, descriptor, wanted, offset);
    if (!chunk) {
      IsAborted(phone, "Read");
      return false;
    }
    const auto count = static_cast<u32>(chunk->size());
    // A file that is being written may grow; one without end would fill the disk of the PC.
    if (uint64_t{offset} + count > std::min<uint64_t>(uint64_t{total} + kMostGrowth, UINT32_MAX)) {
      phone.log().WriteLine(kLogErr, "EFS Read needs more than the %u bytes that the handset told, by far", total);
      return false;
    }
    if (!sink.write(*chunk)) return false;
    full = count == wanted;
    offset += count;
    phone.log().WriteLine(kLogRet, " EFS Read Transferred %u", offset);
    Report(phone, sink.ends, KRAL_EFS_OPERATION_READ, offset, total);
  }
  if (offset >= total) return !IsAborted(phone, "Read");
  phone.log().WriteLine(kLogErr, "EFS Read ended at %u of %u bytes", offset, total);
  return false;
}

bool ReadItem(Diag_FTM& phone, const char* efs_file, u32 size, const Sink& sink) {
  std::vector<u8> data;
  if (size > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "EFS Read of an item file of %u bytes", size);
    return false;
  }
  if (!GetItem(phone, Tries::kTransfer, efs_file, size, sink.ends, data) || IsAborted(phone, "Read")) return false;
  if (data.size() == size) return sink.open() && sink.write(data);
  phone.log().WriteLine(kLogErr, "EFS Read ended at %u of %u bytes", static_cast<u32>(data.size()), size);
  return false;
}

bool ReadOpened(Diag_FTM& phone, const char* efs_file, u32 size, const Sink& sink) {
  RemoteFile file(phone);
  return file.Open(efs_file, kOpenToRead, kModeOfReading) && sink.open() && ReadChunks(phone, file.value(), size, sink);
}

bool Read(Diag_FTM& phone, const char* efs_file, const FileStatus& status, const Sink& sink) {
  if (IsAborted(phone, "Read")) return false;
  return status.is_item_file() ? ReadItem(phone, efs_file, status.size, sink)
                               : ReadOpened(phone, efs_file, status.size, sink);
}

// Into a buffer of `room` bytes; `done` of them are filled.
Sink SinkOfMemory(Diag_FTM& phone, const char* efs_file, u8* buffer, u32 room, u32& done) {
  Sink sink{.ends = {AddressOf(efs_file), AddressOf(buffer)}};
  sink.open = [] { return true; };
  sink.write = [&phone, &done, buffer, room](std::span<const u8> bytes) {
    if (bytes.size() > room - done) {
      phone.log().WriteLine(kLogErr, "EFS Read needs more than the %u bytes of the buffer", room);
      return false;
    }
    std::copy(bytes.begin(), bytes.end(), buffer + done);
    done += static_cast<u32>(bytes.size());
    return true;
  };
  return sink;
}

}  // namespace

bool ReadToFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  ForgetAbort(phone);
  FileStatus status;
  if (!StatExisting(phone, efs_file, status)) return false;
  const char* const name = TextOrEmpty(local_file);
  // Until its Commit nothing of that name has changed.
  AtomicFile file;
  Sink sink{.ends = {AddressOf(efs_file), AddressOf(local_file)}};
  sink.open = [&] {
    if (!file.Open(name)) return true;
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", name);
    return false;
  };
  sink.write = [&](std::span<const u8> bytes) {
    if (!file.Write(bytes)) return true;
    phone.log().WriteLine(kLogErr, "Failed to write to the local file: '%s'", name);
    return false;
  };
  if (!Read(phone, efs_file, status, sink)) return false;
  if (!file.Commit()) return true;
  phone.log().WriteLine(kLogErr, "Failed to write to the local file: '%s'", name);
  return false;
}

bool ReadToMemory(Diag_FTM& phone, const char* efs_file, u8* buffer, u32* size) {
  ForgetAbort(phone);
  if (size == nullptr || (buffer == nullptr && *size > 0)) return false;
  FileStatus status;
  if (!StatExisting(phone, efs_file, status)) return false;
  const u32 room = *size;
  if (status.size > room) {
    phone.log().WriteLine(kLogErr, "EFS Read needs more than the %u bytes of the buffer", room);
    return false;
  }
  u32 done = 0;
  if (!Read(phone, efs_file, status, SinkOfMemory(phone, efs_file, buffer, room, done))) return false;
  *size = done;
  return true;
}

bool ReadOpenedToMemory(Diag_FTM& phone, const char* efs_file, u8* buffer, u32* size) {
  ForgetAbort(phone);
  u32 done = 0;
  if (!ReadOpened(phone, efs_file, *size, SinkOfMemory(phone, efs_file, buffer, *size, done))) return false;
  *size = done;
  return true;
}

}  // namespace kral::efs
