// Copies files of the PC, or memory, to the handset, chunk by chunk.
#include <algorithm>
#include <functional>

#include "base/failure.h"
#include "base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs/efs_handle.h"
#include "storage/efs/efs_packets.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {
namespace {

struct Source {
  u32 size;
  const Progress& progress;
  // Gives the bytes at an offset; false (noted) when they cannot be read.
  std::function<bool(u32 offset, std::span<u8> chunk)> read = {};
};

bool HasRoom(Diag_FTM& phone, u32 size) {
  u32 error = 0;
  KRAL_EFS_STATFS status{};
  const Reply reply = AskStatus(phone, Tries::kTransfer, "/", error, status);
  if (!reply || !IsDone(error, "/")) {
    phone.log().WriteLine(kLogErr, "StatFSAvailSpace() returned %d", reply ? static_cast<int>(error) : -1);
    return false;
  }
  const uint64_t available = uint64_t{status.available_blocks} * status.block_size;
  if (size <= available) return true;
  // Kept: the line says local disk, and means the handset's.
  phone.log().WriteLine(kLogErr, "Available size on local disk is insufficient.  tot_data_size = %u,  availSpace=%lld",
                        size, static_cast<long long>(available));
  // The number that the handset itself would come to later.
  return Fail(Failure(KRAL_ERROR_REFUSED, "no room on the handset for %u bytes: %llu are free", size,
                      static_cast<unsigned long long>(available))
                  .Status(KRAL_ERROR_STATUS_EFS, kNoRoom));
}

// Tried like every packet of a transfer, also after an abort.
bool Remove(Diag_FTM& phone, const char* efs_file) {
  bool unanswered = false;
  for (int attempt = 0; attempt < CleanUpTries(phone); ++attempt) {
    u32 error = 0;
    Compose(phone, kUnlink, PathField(efs_file));
    if (!ExchangeToCleanUp(phone, phone.packet(), DefaultTimeOut(phone)) || !ReadFromEnd(phone, {&error})) {
      unanswered = true;
      continue;
    }
    // A file that is missing now was removed by a try whose answer was lost.
    if (IsDone(error, efs_file) || (unanswered && error == kMissing)) return true;
    phone.log().WriteLine(kLogErr, "EFS Unlink error code %u", error);
  }
  return false;
}

// An item file cannot be opened; an ordinary file takes its place.
bool RemoveItemFile(Diag_FTM& phone, const char* efs_file) {
  FileStatus status;
  if (!Stat(phone, Tries::kTransfer, efs_file, status) || IsAborted(phone, "Write")) return false;
  return !status.is_item_file() || Remove(phone, efs_file);
}

// The packet buffer takes one byte less than it holds.
bool IsUsable(Diag_FTM& phone, u16 packet_size) {
  if (packet_size > kWriteOverhead && packet_size < CDiagPacket::kCapacity) return true;
  phone.log().WriteLine(kLogErr, "EFS Write packet size %d cannot be used", packet_size);
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "a write packet size of %d cannot be used", packet_size));
}

bool WriteChunk(Diag_FTM& phone, const RemoteFile& file, const PacketSizes& sizes, u32 offset,
                std::span<const u8> chunk, u32& written) {
  const u32 descriptor = file.value();
  Compose(phone, kWrite, descriptor, offset, chunk);
  const u32 most = sizes.MostOf(static_cast<u32>(chunk.size()));
  const auto is_own = [&](std::span<const u8> reply) { return IsOfChunk(reply, descriptor, offset, most); };
  const auto accepts = [&](std::span<const u8> reply) {
    u32 error = kDone;
    if (!ReadAt(phone, kTransferError, error)) return false;
    written = *LoadLe<u32>(reply, kTransferCount);
    if (IsDone(error, file.path())) return true;
    phone.log().WriteLine(kLogErr, "EFS Write error code %u", error);
    return false;
  };
  if (!ExchangeUntil(phone, sizes.TimeOut(PacketTimeOut(phone)), is_own, accepts, sizes.tries())) return false;
  if (written > 0 && written <= chunk.size()) return true;
  phone.log().WriteLine(kLogErr, "EFS Write of %d bytes: the handset wrote %u", static_cast<int>(chunk.size()),
                        written);
  return Contradicts(phone);
}

// True also when the transfer was aborted.
bool WriteChunks(Diag_FTM& phone, const RemoteFile& file, PacketSizes sizes, const Source& source) {
  const std::atomic<bool>& abort = *phone.state<Settings>().heeded_abort();
  std::vector<u8> buffer(sizes.size() - kWriteOverhead);
  for (u32 offset = 0; offset < source.size && !abort;) {
    const size_t room = sizes.size() - kWriteOverhead;
    const auto chunk = std::span(buffer).first(std::min<size_t>(room, source.size - offset));
    if (!source.read(offset, chunk)) {
      phone.log().WriteLine(kLogErr, "EFS Write: the local file cannot be read at %u", offset);
      return false;
    }
    u32 written = 0;
    if (!WriteChunk(phone, file, sizes, offset, chunk, written)) {
      if (!abort && sizes.FallBack()) continue;
      return abort;
    }
    sizes.Passed(kWriteOverhead + written);
    offset += written;
    phone.log().WriteLine(kLogRet, " EFS Write Transferred %u / %u bytes", offset, source.size);
    Tell(source.progress, KRAL_EFS_OPERATION_WRITE, offset, source.size);
  }
  return true;
}

bool Write(Diag_FTM& phone, const Source& source, const char* efs_file) {
  if (efs_file == nullptr) efs_file = "";
  // The handset's old file goes with the next steps, so everything that can be known to fail has failed before.
  const PacketSizes sizes(phone, Direction::kToHandset, source.size);
  if (!RemoteFile::CanOpen(phone, efs_file) || !IsUsable(phone, sizes.callers_size())) return false;
  if (!HasRoom(phone, source.size) || IsAborted(phone, "Write") || !RemoveItemFile(phone, efs_file)) return false;
  RemoteFile file(phone, efs_file);
  if (IsAborted(phone, "Write") || !file.Open(kOpenToWrite, kModeOfNewFiles)) return false;
  const bool written = WriteChunks(phone, file, sizes, source);
  if (!written) phone.log().WriteLine(kLogErr, "EFS2WriteEntireFile() failed");
  const bool closed = written && file.Close();
  if (!IsAborted(phone, "Write") && closed) return true;
  // What is there now is a part of the file.
  const KeepFailure keep;
  file.Close();
  if (!Remove(phone, efs_file)) phone.log().WriteLine(kLogErr, "EFS Write leaves a part of %s behind", efs_file);
  return false;
}

bool WriteLocalFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  const char* const name = TextOrEmpty(local_file);
  FileReader file;
  const std::error_code opened = file.Open(name, FileReader::Others::kMayWrite);
  if (opened) {
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", name);
    return Fail(FileFailure(name, "cannot be read").System(opened));
  }
  if (file.size() > UINT32_MAX) {
    phone.log().WriteLine(kLogErr, "PC file %s has %llu bytes, more than a file of the handset can have", name,
                          static_cast<unsigned long long>(file.size()));
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the file %s has %llu bytes, more than one of the handset can have", name,
                        static_cast<unsigned long long>(file.size())));
  }
  const Progress progress = CallersProgress(phone, local_file, efs_file);
  Source source{.size = static_cast<u32>(file.size()), .progress = progress};
  source.read = [&](u32 offset, std::span<u8> chunk) {
    size_t count = 0;
    std::error_code error = file.Seek(offset);
    if (!error) error = file.Read(chunk, count);
    if (!error && count == chunk.size()) return true;
    return Fail(FileFailure(name, error ? "cannot be read" : "has become shorter").System(error).Offset(offset));
  };
  return Write(phone, source, efs_file);
}

}  // namespace

bool WriteFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  const Transfer transfer(phone);
  const bool passed = WriteLocalFile(phone, local_file, efs_file);
  phone.log().WriteLine(passed ? kLogRet : kLogErr, "KRAL_EfsWrite() - %s", passed ? "PASS" : "FAIL");
  return passed;
}

bool WriteMemory(Diag_FTM& phone, std::span<const u8> bytes, const char* efs_file, const Progress& progress) {
  const Transfer transfer(phone);
  Source source{.size = static_cast<u32>(bytes.size()), .progress = progress};
  source.read = [bytes](u32 offset, std::span<u8> chunk) {
    std::copy_n(bytes.subspan(offset).begin(), chunk.size(), chunk.begin());
    return true;
  };
  return Write(phone, source, efs_file);
}

bool WriteFromMemory(Diag_FTM& phone, const u8* buffer, u32 size, const char* efs_file) {
  if (buffer == nullptr && size > 0) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer with the data"));
  return WriteMemory(phone, {buffer, size}, efs_file, CallersProgress(phone, buffer, efs_file));
}

}  // namespace kral::efs
