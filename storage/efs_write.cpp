// Copies files of the PC, or memory, to the handset, chunk by chunk.
#include <algorithm>
#include <functional>

#include "frame/base/failure.h"
#include "frame/base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs_handle.h"
#include "storage/efs_request.h"
#include "storage/efs_transfer.h"

namespace kral::efs {
namespace {

struct Source {
  u32 size;
  TransferEnds ends;
  // Gives the bytes at an offset; false when they cannot be read.
  std::function<bool(u32 offset, std::span<u8> chunk)> read = {};
};

bool HasRoom(Diag_FTM& phone, u32 size) {
  u32 error = 0;
  KRAL_EFS_STATFS status{};
  const bool answered = AskStatus(phone, Tries::kTransfer, "/", error, status);
  if (!answered || error != kDone) {
    phone.log().WriteLine(kLogErr, "StatFSAvailSpace() returned %d", answered ? static_cast<int>(error) : -1);
    return false;
  }
  const uint64_t available = uint64_t{status.available_blocks} * status.block_size;
  if (size <= available) return true;
  phone.log().WriteLine(kLogErr, "Available size on local disk is insufficient.  tot_data_size = %u,  availSpace=%lld",
                        size, static_cast<long long>(available));
  return false;
}

// Tried like every packet of a transfer, also after an abort.
bool Remove(Diag_FTM& phone, const char* efs_file) {
  bool unanswered = false;
  const int tries = CleanUpTries(phone);
  for (int attempt = 0; attempt < tries; ++attempt) {
    u32 error = 0;
    Compose(phone, kUnlink, PathField(efs_file));
    if (!Exchange(phone, CleanUpTimeOut(phone, DefaultTimeOut(phone))) || !ReadFromEnd(phone, {&error})) {
      unanswered = true;
      continue;
    }
    // A file that is missing now was removed by a try whose answer was lost.
    if (error == kDone || (unanswered && error == kMissing)) return true;
    phone.log().WriteLine(kLogErr, "EFS Unlink error code %u", error);
  }
  return false;
}

// An item file cannot be opened; an ordinary file takes its place.
bool RemoveItemFile(Diag_FTM& phone, const char* efs_file) {
  FileStatus status;
  if (!StatInTransfer(phone, efs_file, status) || IsAborted(phone, "Write")) return false;
  return !status.is_item_file() || Remove(phone, efs_file);
}

// The packet buffer takes one byte less than it holds.
bool IsUsable(Diag_FTM& phone, u16 packet_size) {
  if (packet_size > kWriteOverhead && packet_size < CDiagPacket::kCapacity) return true;
  phone.log().WriteLine(kLogErr, "EFS Write packet size %d cannot be used", packet_size);
  return false;
}

bool WriteChunk(Diag_FTM& phone, u32 descriptor, u32 offset, std::span<const u8> chunk, u32& written) {
  Compose(phone, kWrite, descriptor, offset, chunk);
  const auto is_own = [&](std::span<const u8> reply) { return IsOfChunk(reply, descriptor, offset); };
  const bool accepted = ExchangeUntil(phone, PacketTimeOut(phone), is_own, [&](std::span<const u8> reply) {
    const auto error = LoadLe<u32>(reply, kTransferError);
    if (!error) return false;
    if (*error != kDone) phone.log().WriteLine(kLogErr, "EFS Write error code %u", *error);
    written = *LoadLe<u32>(reply, kTransferCount);
    return *error == kDone;
  });
  if (!accepted) return false;
  if (written > 0 && written <= chunk.size()) return true;
  phone.log().WriteLine(kLogErr, "EFS Write of %d bytes: the handset wrote %u", static_cast<int>(chunk.size()),
                        written);
  return false;
}

// True also when the transfer was aborted.
bool WriteChunks(Diag_FTM& phone, u32 descriptor, u16 packet_size, const Source& source) {
  std::vector<u8> buffer(packet_size - kWriteOverhead);
  for (u32 offset = 0; offset < source.size && !phone.efs().abort;) {
    const auto chunk = std::span(buffer).first(std::min<size_t>(buffer.size(), source.size - offset));
    if (!source.read(offset, chunk)) {
      phone.log().WriteLine(kLogErr, "EFS Write: the local file cannot be read at %u", offset);
      return false;
    }
    u32 written = 0;
    if (!WriteChunk(phone, descriptor, offset, chunk, written)) return phone.efs().abort;
    offset += written;
    phone.log().WriteLine(kLogRet, " EFS Write Transferred %u / %u bytes", offset, source.size);
    Report(phone, source.ends, KRAL_EFS_OPERATION_WRITE, offset, source.size);
  }
  return true;
}

bool Write(Diag_FTM& phone, const Source& source, const char* efs_file) {
  if (efs_file == nullptr) efs_file = "";
  // The handset's old file goes with the next steps, so everything that can be known to fail has failed before.
  const u16 packet_size = phone.efs().write_packet_size;
  if (!RemoteFile::CanOpen(phone, efs_file) || !IsUsable(phone, packet_size)) return false;
  if (!HasRoom(phone, source.size) || IsAborted(phone, "Write") || !RemoveItemFile(phone, efs_file)) return false;
  RemoteFile file(phone);
  if (IsAborted(phone, "Write") || !file.Open(efs_file, kOpenToWrite, kModeOfNewFiles)) return false;
  const bool written = WriteChunks(phone, file.value(), packet_size, source);
  if (!written) phone.log().WriteLine(kLogErr, "EFS2WriteEntireFile() failed");
  const bool closed = file.Close();
  if (!IsAborted(phone, "Write") && written && closed) return true;
  // What is there now is a part of the file.
  const KeepFailure keep;
  if (!Remove(phone, efs_file)) phone.log().WriteLine(kLogErr, "EFS Write leaves a part of %s behind", efs_file);
  return false;
}

bool WriteLocalFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  FileReader file;
  if (file.Open(TextOrEmpty(local_file), FileReader::Others::kMayWrite)) {
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", TextOrEmpty(local_file));
    return false;
  }
  if (file.size() > UINT32_MAX) {
    phone.log().WriteLine(kLogErr, "PC file %s has %llu bytes, more than a file of the handset can have",
                          TextOrEmpty(local_file), static_cast<unsigned long long>(file.size()));
    return false;
  }
  Source source{.size = static_cast<u32>(file.size()), .ends = {AddressOf(local_file), AddressOf(efs_file)}};
  source.read = [&file](u32 offset, std::span<u8> chunk) {
    size_t count = 0;
    return !file.Seek(offset) && !file.Read(chunk, count) && count == chunk.size();
  };
  return Write(phone, source, efs_file);
}

}  // namespace

bool WriteFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  ForgetAbort(phone);
  const bool passed = WriteLocalFile(phone, local_file, efs_file);
  phone.log().WriteLine(passed ? kLogRet : kLogErr, "KRAL_EfsWrite() - %s", passed ? "PASS" : "FAIL");
  return passed;
}

bool WriteFromMemory(Diag_FTM& phone, const u8* buffer, u32 size, const char* efs_file) {
  ForgetAbort(phone);
  if (buffer == nullptr && size > 0) return false;
  Source source{.size = size, .ends = {AddressOf(buffer), AddressOf(efs_file)}};
  source.read = [buffer](u32 offset, std::span<u8> chunk) {
    std::copy_n(buffer + offset, chunk.size(), chunk.begin());
    return true;
  };
  return Write(phone, source, efs_file);
}

}  // namespace kral::efs
