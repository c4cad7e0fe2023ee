// Copies files of the PC, or memory, to the handset, chunk by chunk.
#include <algorithm>
#include <fstream>
#include <functional>

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
  const bool answered = FileSystemStatus(phone, "/", &error, &status);
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

// An item file cannot be opened; an ordinary file takes its place.
bool RemoveItemFile(Diag_FTM& phone, const char* efs_file) {
  FileStatus status;
  if (!Stat(phone, efs_file, status)) return false;
  if (!status.is_item_file()) return true;
  u32 error = 0;
  return Unlink(phone, efs_file, &error) && error == kDone;
}

bool WriteChunk(Diag_FTM& phone, u32 descriptor, u32 offset, std::span<const u8> chunk, u32& written) {
  Compose(phone, kWrite, descriptor, offset, chunk);
  const bool accepted = ExchangeUntil(phone, PacketTimeOut(phone), [&](std::span<const u8> reply) {
    const auto error = LoadLe<u32>(reply, kTransferError);
    // The answer to an earlier packet, come late, tells another offset.
    if (!error || LoadLe<u32>(reply, kHandleAt) != descriptor || LoadLe<u32>(reply, kTransferOffset) != offset) {
      return false;
    }
    if (*error != kDone) phone.log().WriteLine(kLogErr, "EFS Write error code %d", static_cast<int>(*error));
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
bool WriteChunks(Diag_FTM& phone, u32 descriptor, const Source& source) {
  const u16 packet_size = phone.efs().write_packet_size;
  // The packet buffer takes one byte less than it holds.
  if (packet_size <= kWriteOverhead || packet_size >= CDiagPacket::kCapacity) {
    phone.log().WriteLine(kLogErr, "EFS Write packet size %d cannot be used", packet_size);
    return false;
  }
  std::vector<u8> buffer(packet_size - kWriteOverhead);
  for (u32 offset = 0; offset < source.size && !phone.efs().abort;) {
    const auto chunk = std::span(buffer).first(std::min<size_t>(buffer.size(), source.size - offset));
    u32 written = 0;
    if (!source.read(offset, chunk) || !WriteChunk(phone, descriptor, offset, chunk, written)) return false;
    offset += written;
    phone.log().WriteLine(kLogRet, " EFS Write Transferred %d / %d bytes", static_cast<int>(offset),
                          static_cast<int>(source.size));
    Report(phone, source.ends, KRAL_EFS_OPERATION_WRITE, offset, source.size);
  }
  return true;
}

bool Write(Diag_FTM& phone, const Source& source, const char* efs_file) {
  if (!HasRoom(phone, source.size) || !RemoveItemFile(phone, efs_file)) return false;
  RemoteFile file(phone);
  if (!file.Open(efs_file, kOpenToWrite, kModeOfNewFiles)) return false;
  const bool written = WriteChunks(phone, file.value(), source);
  if (!written) phone.log().WriteLine(kLogErr, "EFS2WriteEntireFile() failed");
  const bool closed = file.Close();
  if (written && closed && !phone.efs().abort) return true;
  // What is there now is a part of the file.
  Unlink(phone, efs_file, nullptr);
  return false;
}

bool WriteLocalFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  std::ifstream file(local_file == nullptr ? "" : local_file, std::ios::binary | std::ios::ate);
  const auto size = static_cast<int64_t>(file.tellg());
  // A folder opens on some systems and has no end.
  if (!file || size < 0 || size > UINT32_MAX) {
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", local_file == nullptr ? "" : local_file);
    return false;
  }
  Source source{.size = static_cast<u32>(size), .ends = {AddressOf(local_file), AddressOf(efs_file)}};
  source.read = [&file](u32 offset, std::span<u8> chunk) {
    file.seekg(offset);
    file.read(reinterpret_cast<char*>(chunk.data()), static_cast<std::streamsize>(chunk.size()));
    return file.good();
  };
  return Write(phone, source, efs_file);
}

}  // namespace

bool WriteFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  phone.efs().abort = false;
  const bool passed = WriteLocalFile(phone, local_file, efs_file);
  phone.log().WriteLine(passed ? kLogRet : kLogErr, "KRAL_EfsWrite() - %s", passed ? "PASS" : "FAIL");
  return passed;
}

bool WriteFromMemory(Diag_FTM& phone, const u8* buffer, u32 size, const char* efs_file) {
  phone.efs().abort = false;
  if (buffer == nullptr && size > 0) return false;
  Source source{.size = size, .ends = {AddressOf(buffer), AddressOf(efs_file)}};
  source.read = [buffer](u32 offset, std::span<u8> chunk) {
    std::copy_n(buffer + offset, chunk.size(), chunk.begin());
    return true;
  };
  return Write(phone, source, efs_file);
}

}  // namespace kral::efs
