// Answers FTM requests under both command codes and models the transceivers behind the dispatchers.
#include "handset/services/ftm_service.h"

#include <algorithm>

#include "handset/line/wire.h"

namespace kral::handset {
namespace {

constexpr uint8_t kFtmSubsystem = 11;
constexpr uint8_t kLegacyCode = 59;
constexpr size_t kHeaderSize = 6;        // code, subsystem, mode id, command id
constexpr size_t kLegacyHeaderSize = 7;  // code, selector, length, zero, command id
constexpr uint16_t kLegacySelector = 0x0077;
constexpr size_t kRememberedCommands = 4096;
constexpr int kNoiseFloor = -11000;  // hundredths of a dBm
constexpr int kMaximumPower = 2450;

enum Command : uint16_t {
  kTxOn = 2,
  kTxOff = 3,
  kSetMode = 7,
  kSetChannel = 8,
  kGetRxAgc = 53,
  kGetDetector = 119,
  kSetTxPower = 176,
  kGetRxLevel = 179,
  kGetRssi = 230,
};

// How much louder the front end is at a channel than at the lowest one: a tenth of a dB every 64 channels.
int ChannelSlope(uint16_t channel) {
  return channel % 4096 / 64 * 10;
}

int16_t Signed(ByteView payload) {
  return static_cast<int16_t>(GetU16(payload, 0));
}

}  // namespace

int16_t Radio::AgcWord() const {
  const int level = std::max<int>(input_level, kNoiseFloor) + ChannelSlope(channel);
  return static_cast<int16_t>(-level / 10);
}

int8_t Radio::Rssi() const {
  return static_cast<int8_t>(std::clamp<int>(input_level, kNoiseFloor, 0) / 100);
}

uint16_t Radio::DetectorWord() const {
  if (!transmitting) return 12;
  const int power = std::clamp<int>(tx_power + ChannelSlope(channel), kNoiseFloor, kMaximumPower);
  return static_cast<uint16_t>(12 + (power - kNoiseFloor) / 4);
}

void FtmService::Register(RequestTable& table) {
  table.OnSubsystem(kFtmSubsystem, Length::AtLeast(kHeaderSize),
                    [this](ByteView request, Wire& wire) { OnRequest(request, wire); });
  table.On(kLegacyCode, Length::AtLeast(kLegacyHeaderSize),
           [this](ByteView request, Wire& wire) { OnLegacyRequest(request, wire); });
}

void FtmService::OnReset() {
  const std::lock_guard lock(mutex_);
  for (auto& [mode_id, radio] : radios_) {
    const int16_t input_level = radio.input_level;  // what is cabled to the port survives a restart
    radio = Radio{};
    radio.input_level = input_level;
  }
}

void FtmService::SetInputLevel(uint16_t mode_id, int16_t hundredths_of_dbm) {
  const std::lock_guard lock(mutex_);
  radios_[mode_id].input_level = hundredths_of_dbm;
}

std::vector<FtmCommand> FtmService::commands() const {
  const std::lock_guard lock(mutex_);
  return commands_;
}

void FtmService::OnRequest(ByteView request, Wire& wire) {
  if (!InFtm()) return Refuse(Refusal::kBadMode, request, wire);
  const auto result = Carry(GetU16(request, 2), GetU16(request, 4), request.subspan(kHeaderSize));
  if (!result) return Refuse(Refusal::kBadParameter, request, wire);
  wire.Send(ByteWriter().Raw(request.first(kHeaderSize)).Raw(*result).Take());
}

void FtmService::OnLegacyRequest(ByteView request, Wire& wire) {
  if (GetU16(request, 1) != kLegacySelector) return Refuse(Refusal::kBadParameter, request, wire);
  if (!InFtm()) return Refuse(Refusal::kBadMode, request, wire);
  const auto result = Carry(0, GetU16(request, 5), request.subspan(kLegacyHeaderSize));
  if (!result) return Refuse(Refusal::kBadParameter, request, wire);
  wire.Send(ByteWriter().Raw(request.first(kLegacyHeaderSize)).Raw(*result).Take());
}

std::optional<Bytes> FtmService::Carry(uint16_t mode_id, uint16_t command, ByteView payload) {
  const std::lock_guard lock(mutex_);
  if (commands_.size() == kRememberedCommands) commands_.erase(commands_.begin());
  commands_.push_back({mode_id, command, Bytes(payload.begin(), payload.end())});

  if (const auto dispatcher = dispatchers_.find(mode_id); dispatcher != dispatchers_.end()) {
    return dispatcher->second(command, payload);
  }
  Radio& radio = radios_[mode_id];
  ByteWriter result;
  switch (command) {
    case kTxOn:
      radio.transmitting = true;
      break;
    case kTxOff:
      radio.transmitting = false;
      break;
    case kSetMode:
      radio.rf_mode = GetU16(payload, 0);
      radio.transmitting = false;
      break;
    case kSetChannel:
      radio.channel = GetU16(payload, 0);
      break;
    case kSetTxPower:
      radio.tx_power = Signed(payload);
      break;
    case kGetRxAgc:
      result.U16(static_cast<uint16_t>(radio.AgcWord()));
      break;
    case kGetRssi:
      result.U8(static_cast<uint8_t>(radio.Rssi()));
      break;
    case kGetRxLevel:
      result.U16(static_cast<uint16_t>(std::max<int>(radio.input_level, kNoiseFloor)));
      break;
    case kGetDetector:
      result.U16(radio.DetectorWord());
      break;
    default:
      result.Raw(payload);  // acknowledged as it came
      break;
  }
  return result.Take();
}

}  // namespace kral::handset
