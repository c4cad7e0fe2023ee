// Copies files of the handset to the PC, or into memory, chunk by chunk; item files in one piece.
#include <algorithm>
#include <functional>

#include "base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs/efs_handle.h"
#include "storage/efs/efs_packets.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {
namespace {

struct Sink {
  const Progress& progress;
  // Both note what is wrong when they give false.
  std::function<bool()> open = {};  // once the handset's file is
  std::function<bool(std::span<const u8> bytes)> write = {};
};

bool StatExisting(Diag_FTM& phone, const char* efs_file, FileStatus& status) {
  if (!Stat(phone, Tries::kTransfer, efs_file, status)) return false;
  if (IsDone(status.error_number, efs_file)) return true;
  phone.log().WriteLine(kLogErr, "EFS Read error code %d", static_cast<int>(status.error_number));
  return false;
}

// The data of one chunk, in the phone's packet buffer; nothing when it could not be had.
std::optional<std::span<const u8>> ReadChunk(Diag_FTM& phone, const RemoteFile& file, const PacketSizes& sizes,
                                             u32 wanted, u32 offset) {
  const u32 descriptor = file.value();
  Compose(phone, kRead, descriptor, wanted, offset);
  u32 error = 0;
  u32 count = 0;
  const u32 most = sizes.MostOf(wanted);
  const auto is_own = [&](std::span<const u8> reply) { return IsOfChunk(reply, descriptor, offset, most); };
  const auto accepts = [&](std::span<const u8> reply) {
    if (!ReadAt(phone, kTransferError, error)) return false;
    count = *LoadLe<u32>(reply, kTransferCount);
    return error != kDone || (count <= wanted && count <= reply.size() - kReadData) || Contradicts(phone);
  };
  if (!ExchangeUntil(phone, sizes.TimeOut(DefaultTimeOut(phone)), is_own, accepts, sizes.tries())) return std::nullopt;
  if (!IsDone(error, file.path())) {
    phone.log().WriteLine(kLogErr, "EFS Read error code %d", static_cast<int>(error));
    return std::nullopt;
  }
  return phone.packet().response().subspan(kReadData, count);
}

bool EndedEarly(Diag_FTM& phone, const char* efs_file, u32 offset, u32 total) {
  phone.log().WriteLine(kLogErr, "EFS Read ended at %u of %u bytes", offset, total);
  return Fail(
      Failure(KRAL_ERROR_LINK, "%s ended at %u of %u bytes", TextOrEmpty(efs_file), offset, total).Offset(offset));
}

bool CanRead(Diag_FTM& phone, u16 packet_size, u32 total) {
  // A larger size works for files that do not fill a packet.
  const u32 wanted = packet_size - std::min<u32>(packet_size, kReadOverhead);
  if (wanted > 0 && kReadOverhead + std::min(wanted, total) <= kLongestReply) return true;
  phone.log().WriteLine(kLogErr, "EFS Read packet size %d cannot be used", packet_size);
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "a read packet size of %d cannot be used", packet_size));
}

// A file that is being written may grow; one without end would fill the disk of the PC.
bool IsWithinGrowth(Diag_FTM& phone, uint64_t end, u32 total) {
  if (end <= std::min<uint64_t>(uint64_t{total} + kMostGrowth, UINT32_MAX)) return true;
  phone.log().WriteLine(kLogErr, "EFS Read needs more than the %u bytes that the handset told, by far", total);
  return Contradicts(phone);
}

// False also when the transfer was aborted, and when the file turned out shorter than the handset told.
bool ReadChunks(Diag_FTM& phone, const RemoteFile& file, u32 total, const Sink& sink) {
  PacketSizes sizes(phone, Direction::kFromHandset, total);
  if (!CanRead(phone, sizes.callers_size(), total)) return false;
  u32 offset = 0;
  for (bool more = true; more;) {
    if (IsAborted(phone, "Read")) return false;
    const auto wanted = static_cast<u32>(sizes.size() - kReadOverhead);
    const auto chunk = ReadChunk(phone, file, sizes, wanted, offset);
    if (!chunk) {
      if (IsAborted(phone, "Read") || !sizes.FallBack()) return false;
      continue;
    }
    const auto count = static_cast<u32>(chunk->size());
    sizes.Passed(kReadOverhead + count);
    if (!IsWithinGrowth(phone, uint64_t{offset} + count, total) || !sink.write(*chunk)) return false;
    offset += count;
    // Of more than the caller's size the handset may send what it can.
    more = count == wanted || (!sizes.is_callers() && count > 0 && offset < total);
    phone.log().WriteLine(kLogRet, " EFS Read Transferred %u", offset);
    Tell(sink.progress, KRAL_EFS_OPERATION_READ, offset, total);
  }
  if (offset >= total) return !IsAborted(phone, "Read");
  return EndedEarly(phone, file.path(), offset, total);
}

bool ReadItem(Diag_FTM& phone, const char* efs_file, u32 size, const Sink& sink) {
  std::vector<u8> data;
  if (size > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "EFS Read of an item file of %u bytes", size);
    return Fail(
        Failure(KRAL_ERROR_LINK, "the item file %s has %u bytes, more than one can have", TextOrEmpty(efs_file), size));
  }
  u32 error = 0;
  if (!GetItem(phone, Tries::kTransfer, efs_file, size, data, error) || !IsDone(error, efs_file)) return false;
  const auto count = static_cast<u32>(data.size());
  Tell(sink.progress, KRAL_EFS_OPERATION_GET_ITEM, count, size);
  if (IsAborted(phone, "Read")) return false;
  return count == size ? sink.open() && sink.write(data) : EndedEarly(phone, efs_file, count, size);
}

bool ReadOpened(Diag_FTM& phone, const char* efs_file, u32 size, const Sink& sink) {
  RemoteFile file(phone, efs_file);
  return file.Open(kOpenToRead, kModeOfReading) && sink.open() && ReadChunks(phone, file, size, sink);
}

bool Read(Diag_FTM& phone, const char* efs_file, const FileStatus& status, const Sink& sink) {
  if (IsAborted(phone, "Read")) return false;
  return status.is_item_file() ? ReadItem(phone, efs_file, status.size, sink)
                               : ReadOpened(phone, efs_file, status.size, sink);
}

bool Fits(Diag_FTM& phone, const char* efs_file, uint64_t needed, size_t room) {
  if (needed <= room) return true;
  phone.log().WriteLine(kLogErr, "EFS Read needs more than the %u bytes of the buffer", static_cast<u32>(room));
  return Fail(
      Failure(KRAL_ERROR_ARGUMENT, "%s needs more than the %zu bytes of the buffer", TextOrEmpty(efs_file), room));
}

// Into a buffer of `room` bytes; `done` of them are filled.
Sink SinkOfMemory(Diag_FTM& phone, const char* efs_file, std::span<u8> room, const Progress& progress, u32& done) {
  Sink sink{.progress = progress};
  sink.open = [] { return true; };
  sink.write = [&phone, &done, room, efs_file](std::span<const u8> bytes) {
    if (!Fits(phone, efs_file, uint64_t{done} + bytes.size(), room.size())) return false;
    std::ranges::copy(bytes, room.subspan(done).begin());
    done += static_cast<u32>(bytes.size());
    return true;
  };
  return sink;
}

}  // namespace

bool ReadToFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  const Transfer transfer(phone);
  FileStatus status;
  if (!StatExisting(phone, efs_file, status)) return false;
  const char* const name = TextOrEmpty(local_file);
  const auto written = [&](const std::error_code& error) {
    if (!error) return true;
    phone.log().WriteLine(kLogErr, "Failed to write to the local file: '%s'", name);
    return Fail(FileFailure(name, "cannot be written").System(error));
  };
  // Until its Commit nothing of that name has changed.
  AtomicFile file;
  const Progress progress = CallersProgress(phone, efs_file, local_file);
  Sink sink{.progress = progress};
  sink.open = [&] {
    const std::error_code error = file.Open(name);
    if (!error) return true;
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", name);
    return Fail(FileFailure(name, "cannot be made").System(error));
  };
  sink.write = [&](std::span<const u8> bytes) { return written(file.Write(bytes)); };
  return Read(phone, efs_file, status, sink) && written(file.Commit());
}

bool ReadToMemory(Diag_FTM& phone, const char* efs_file, u8* buffer, u32* size) {
  const Transfer transfer(phone);
  if (size == nullptr || (buffer == nullptr && *size > 0)) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer, or no size of one"));
  }
  FileStatus status;
  if (!StatExisting(phone, efs_file, status) || !Fits(phone, efs_file, status.size, *size)) return false;
  const Progress progress = CallersProgress(phone, efs_file, buffer);
  u32 done = 0;
  if (!Read(phone, efs_file, status, SinkOfMemory(phone, efs_file, {buffer, *size}, progress, done))) return false;
  *size = done;
  return true;
}

bool ReadPlainFile(Diag_FTM& phone, const char* efs_file, u8* buffer, u32* size) {
  const Transfer transfer(phone);
  const Progress nobody;
  u32 done = 0;
  if (!ReadOpened(phone, efs_file, *size, SinkOfMemory(phone, efs_file, {buffer, *size}, nobody, done))) return false;
  *size = done;
  return true;
}

}  // namespace kral::efs
