// The security mode and partition table packets.
#include "download/stream/image_set_up.h"

#include <algorithm>
#include <vector>

#include "base/failure.h"
#include "download/stream/stream_format.h"
#include "platform/file_util.h"

namespace kral::stream {
namespace {

constexpr uint8_t kUseOverride = 1;
constexpr uint8_t kBadFormat = 2;
constexpr uint8_t kEraseFailed = 3;

void LogRefusal(DataLogFileHandler& log, uint8_t status) {
  switch (status) {
    case kUseOverride:
      return log.WriteLine(kLogErr, "partition : error use override");
    case kBadFormat:
      return log.WriteLine(kLogErr, "partition : error bad format");
    case kEraseFailed:
      return log.WriteLine(kLogErr, "partition : error erase fail");
    default:
      return log.WriteLine(kLogErr, "partition : invalid status %u", static_cast<unsigned>(status));
  }
}

Failure Refusal(uint8_t status) {
  const char* const reason = status == kUseOverride   ? "it differs from the one in flash and may not replace it"
                             : status == kBadFormat   ? "it has a bad format"
                             : status == kEraseFailed ? "the one in flash cannot be erased"
                                                      : "for a reason of its own";
  return Failure(KRAL_ERROR_REFUSED, "the handset refused the partition table with %d: %s", status, reason)
      .Status(KRAL_ERROR_STATUS_LOADER, status);
}

}  // namespace

bool CImageSecMode::Send(uint8_t mode) {
  const std::vector<uint8_t> request = {kSecurityMode, mode};
  return bool(connection_.Exchange(request, kSecurityModeReply, time_out_ms_));
}

bool ReadPartitionTable(DataLogFileHandler& log, const std::string& file, std::vector<uint8_t>& table) {
  const auto error = ReadWholeFile(file, kPartitionTableSize, table);
  if (!error) return true;
  if (error == std::errc::file_too_large) {
    log.WriteLine(kLogErr, "partition : file exceeds 512 bytes");
    return Fail(FileFailure(file, "has more than the 512 bytes of a partition table"));
  }
  log.WriteLine(kLogErr, "partition : failed to open file %s", file.c_str());
  return Fail(FileFailure(file, "cannot be opened").System(error));
}

bool CImagePartition::Send(std::span<const uint8_t> table, bool override_table, std::optional<uint8_t>& status) {
  std::vector<uint8_t> request(2 + kPartitionTableSize);
  request[0] = kPartitionTable;
  request[1] = override_table ? 1 : 0;
  std::copy_n(table.begin(), std::min<size_t>(table.size(), kPartitionTableSize), request.begin() + 2);
  const Reply reply = connection_.Exchange(request, kPartitionTableReply, time_out_ms_);
  if (!reply) return false;
  if (reply.bytes().size() != kStatusReplySize) {
    return Fail(Failure(KRAL_ERROR_LINK, "the answer to the partition table has %zu bytes", reply.bytes().size()));
  }
  status = reply.bytes()[kStatusAt];
  if (*status == kStatusDone) return true;
  LogRefusal(connection_.log(), *status);
  return Fail(Refusal(*status));
}

}  // namespace kral::stream
