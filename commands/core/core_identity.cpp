// Who the handset is: version, extended build identity, electronic serial number.
#include <algorithm>
#include <array>
#include <cstring>
#include <span>
#include <string>

#include "base/little_endian.h"
#include "base/outputs.h"
#include "commands/core/core_diag.h"
#include "commands/core/core_diag_format.h"
#include "commands/nv/nv_item.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"
#include "kral/diag.h"

namespace kral::diag {
namespace {

// The version response as last received in full.
struct VersionRecord {
  std::array<uint8_t, CDiagPacket::kCapacity> bytes;
};

void PutText(char* output, std::span<const uint8_t> record, TextField field) {
  if (output != nullptr) std::memcpy(output, record.data() + field.offset, field.size);
}

// The next text of `rest`, up to its terminator or the end of what was received; `rest` then begins behind it.
std::string TakeText(std::span<const uint8_t>& rest) {
  const auto end = std::ranges::find(rest, uint8_t{0});
  std::string text(rest.begin(), end);
  rest = rest.subspan(std::min(rest.size(), text.size() + 1));
  return text.substr(0, KRAL_BUILD_ID_TEXT_SIZE - 1);
}

void PutTerminated(char* output, const std::string& text) {
  if (output != nullptr) std::memcpy(output, text.c_str(), text.size() + 1);
}

}  // namespace

bool ReadVersion(Diag_FTM& phone, const VersionOutputs& outputs) {
  namespace reply = version_reply;
  phone.log().WriteLine(kLogFn, "KRAL_DIAG_VERNO_F()");
  if (!Send(phone, kVersion)) return false;

  // A shorter reply is not taken, yet the request counts as answered: the outputs then show the record as the last
  // full reply left it. The record is not cleared between requests, on purpose.
  std::span<uint8_t> record = phone.state<VersionRecord>().bytes;
  const auto response = phone.packet().response();
  if (response.size() >= reply::kLeastCopied) std::ranges::copy(response, record.begin());

  PutText(outputs.compile_date, record, reply::kCompileDate);
  PutText(outputs.compile_time, record, reply::kCompileTime);
  PutText(outputs.release_date, record, reply::kReleaseDate);
  PutText(outputs.release_time, record, reply::kReleaseTime);
  PutText(outputs.version_directory, record, reply::kVersionDirectory);
  Put(outputs.station_class_mark, record[reply::kStationClassMark]);
  Put(outputs.air_interface_revision, record[reply::kAirInterfaceRevision]);
  Put(outputs.mobile_model, record[reply::kMobileModel]);
  Put(outputs.firmware_revision, *LoadLe<uint16_t>(record, reply::kFirmwareRevision));
  Put(outputs.slot_cycle_index, record[reply::kSlotCycleIndex]);
  Put(outputs.vocoder_major, record[reply::kVocoderMajor]);
  Put(outputs.vocoder_minor, record[reply::kVocoderMinor]);
  return true;
}

bool ReadExtendedBuildId(Diag_FTM& phone, uint32_t* hardware_version, uint32_t* mobile_model, char* software_revision,
                         char* model) {
  namespace reply = build_id_reply;
  phone.log().WriteLine(kLogFn, "KRAL_DIAG_EXT_BUILD_ID_F()");
  if (!Send(phone, kExtendedBuildId)) return false;

  const auto response = phone.packet().response();
  const auto hardware = LoadLe<uint32_t>(response, reply::kHardwareVersion);
  const auto mobile = LoadLe<uint32_t>(response, reply::kMobileModel);
  if (!hardware || !mobile) {
    phone.log().WriteLine(kLogErr, "KRAL_DIAG_EXT_BUILD_ID_F() -- reply of %d bytes is too short",
                          static_cast<int>(response.size()));
    return Fail(BadReply(phone, "is too short"));
  }
  auto texts = response.subspan(reply::kTexts);
  const std::string revision_text = TakeText(texts);
  const std::string model_text = TakeText(texts);

  Put(hardware_version, *hardware);
  Put(mobile_model, *mobile);
  PutTerminated(software_revision, revision_text);
  PutTerminated(model, model_text);
  // Two blanks before the last equals sign: log readers match the line as it is.
  phone.log().WriteLine(
      kLogRet, "KRAL_DIAG_EXT_BUILD_ID_F( iBXC_HW_Version = %d, iMobModel = %d, sMobSwRev = %s, sModelStr  = %s)",
      static_cast<int>(*hardware), static_cast<int>(*mobile), revision_text.c_str(), model_text.c_str());
  return true;
}

bool ReadSerialNumber(Diag_FTM& phone, uint32_t* serial) {
  phone.log().WriteLine(kLogFn, "DIAG_READ_ESN_F() -- Start");
  if (phone.target_type() == kTargetApplication) {
    phone.log().WriteLine(kLogRet, "DIAG_READ_ESN() is not supported on ZTD target. Return 0xDEADBEEF ");
    Put(serial, uint32_t{KRAL_NO_SERIAL_NUMBER});
    return true;
  }
  if (phone.target_type() != kTargetModem) {
    phone.log().WriteLine(kLogErr, "DIAG_READ_ESN(), Unknown target type!");
    Put(serial, uint32_t{KRAL_NO_SERIAL_NUMBER});  // written although the call fails
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the target type %d is unknown", phone.target_type()));
  }

  std::array<uint8_t, 4> item{};
  uint16_t status = 0;
  if (!nv::Read(phone, nv::kEsnItem, item, status)) {
    phone.log().WriteLine(kLogRet, "DIAG_READ_ESN_F() -- failed NV Read");
    return false;
  }
  if (status != nv::kDone) {
    phone.log().WriteLine(kLogRet, "DIAG_READ_ESN_F() -- failed NV Read, status %d", status);
    return Fail(nv::Refusal(nv::kEsnItem, status));
  }
  const uint32_t number = *LoadLe<uint32_t>(item);
  phone.log().WriteLine(kLogRet, "DIAG_READ_ESN_F() -- completed ( iESN = 0x%X)", number);
  Put(serial, number);
  return true;
}

}  // namespace kral::diag
