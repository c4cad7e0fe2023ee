// The requests of the KOVA protocol.
#include "download/kova/kova.h"

#include <vector>

#include "base/failure.h"
#include "download/kova/kova_format.h"

namespace kral::kova {
namespace {

constexpr uint32_t kGoMs = 1000;

void AppendBe(std::vector<uint8_t>& packet, uint32_t value, int bytes) {
  for (int shift = 8 * (bytes - 1); shift >= 0; shift -= 8) packet.push_back(static_cast<uint8_t>(value >> shift));
}

bool Acknowledged(download::DownloadConnection& connection, const std::vector<uint8_t>& request, uint32_t time_out_ms) {
  return bool(connection.Exchange(request, kAcknowledge, time_out_ms));
}

}  // namespace

bool Write32(download::DownloadConnection& connection, uint32_t address, std::span<const uint8_t> data) {
  if (data.size() > kMostWriteData) return false;
  std::vector<uint8_t> request = {kWrite32};
  AppendBe(request, address, 4);
  AppendBe(request, static_cast<uint32_t>(data.size()), 2);
  request.insert(request.end(), data.begin(), data.end());
  return Acknowledged(connection, request, connection.time_out_ms());
}

bool Go(download::DownloadConnection& connection, uint32_t address) {
  std::vector<uint8_t> request = {kGo};
  AppendBe(request, address, 4);
  return Acknowledged(connection, request, kGoMs);
}

bool Nop(download::DownloadConnection& connection) {
  connection.log().WriteLine(kLogRet, "Sending Download NOP command");
  return Acknowledged(connection, {kNop}, connection.time_out_ms());
}

bool Reset(download::DownloadConnection& connection) {
  connection.log().WriteLine(kLogRet, "Sending the Reset command based on the KOVA Download Protocol");
  return Acknowledged(connection, {kReset}, connection.time_out_ms());
}

bool SoftwareVersion(download::DownloadConnection& connection, uint8_t& version) {
  connection.log().WriteLine(kLogRet, "Sending the request for Software Version");
  const uint8_t request = kSoftwareVersion;
  const Reply reply = connection.Exchange({&request, 1}, kSoftwareVersionReply, connection.time_out_ms());
  if (!reply) return false;
  if (reply.bytes().size() < 2)
    return Fail(Failure(KRAL_ERROR_LINK, "the loader's answer holds no version").Command({&request, 1}));
  version = reply.bytes()[1];
  return true;
}

}  // namespace kral::kova
