// Reads and writes RF NV items through the RF NV dispatcher of factory test mode.
#include "commands/ftm/rf_nv.h"

#include "base/little_endian.h"
#include "commands/ftm/ftm_frame.h"
#include "commands/nv/nv_item.h"
#include "frame/request_failure.h"

namespace kral::nv {
namespace {

constexpr u16 kModeIdRfNv = 36;
constexpr u16 kRead = 0;
constexpr u16 kWrite = 1;

// Behind the FTM header of the reply.
constexpr size_t kItem = 0;
constexpr size_t kStatus = 2;
constexpr size_t kSize = 4;
constexpr size_t kData = 6;

bool ReachesDispatchers(Diag_FTM& phone) {
  const ftm::Settings& settings = phone.state<ftm::Settings>();
  return (settings.command_code == ftm::kCommandCode75 && settings.queue_mode == 0) ||
         Fail(Failure(KRAL_ERROR_ARGUMENT, "RF NV items need command code 75 and no queue"));
}

// Sends what the packet buffer holds; the reply behind its header, or nothing when it is not about the item.
bool Exchange(Diag_FTM& phone, u16 item, std::span<const u8>& reply, u16& status) {
  if (!ftm::Transmit(phone)) return false;
  const auto response = phone.packet().response();
  const size_t header = ftm::HeaderSize(phone);
  if (response.size() < header) return Fail(BadReply(phone, "is too short"));
  reply = response.subspan(header);
  const auto reported = LoadLe<u16>(reply, kStatus);
  if (!reported || LoadLe<u16>(reply, kItem) != item) return Fail(BadReply(phone, "is not about the item"));
  status = *reported;
  return true;
}

}  // namespace

bool ReadRf(Diag_FTM& phone, uint16_t item, std::vector<uint8_t>& data, uint16_t& status) {
  if (!ReachesDispatchers(phone)) return false;
  ftm::BeginCommand(phone, kModeIdRfNv, ftm::HeaderForm::kPlain, kRead);
  phone.packet().Append16(item);
  std::span<const u8> reply;
  u16 reported = 0;
  if (!Exchange(phone, item, reply, reported)) return false;
  if (reported == kDone) {
    const auto size = LoadLe<u16>(reply, kSize);
    if (!size || reply.size() - kData < *size) return Fail(BadReply(phone, "holds too few data"));
    const auto content = reply.subspan(kData, *size);
    data.assign(content.begin(), content.end());
  }
  status = reported;
  return true;
}

bool WriteRf(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t& status) {
  if (data.size() > kRfDataSize) {
    return Fail(
        Failure(KRAL_ERROR_ARGUMENT, "RF NV item %d: %zu bytes are more than %zu", item, data.size(), kRfDataSize));
  }
  if (!ReachesDispatchers(phone)) return false;
  ftm::BeginCommand(phone, kModeIdRfNv, ftm::HeaderForm::kPlain, kWrite);
  phone.packet().Append16(item);
  phone.packet().Append16(static_cast<u16>(data.size()));
  phone.packet().AppendBlock(data);
  std::span<const u8> reply;
  return Exchange(phone, item, reply, status);
}

}  // namespace kral::nv
