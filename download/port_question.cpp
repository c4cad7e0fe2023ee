// Asks in the order in which the questions do no harm: a boot loader speaks first and takes any question for a packet
// of its own, software of a handset refuses what it does not know, and loaders take what is not theirs for noise.
#include "download/port_question.h"

#include <algorithm>
#include <array>

#include "base/at_exit.h"
#include "download/boot/kivrat_packet.h"
#include "download/kova/kova_format.h"
#include "download/stream/stream_format.h"
#include "kral/connection.h"

namespace kral {
namespace {

constexpr uint32_t kHelloWaitMs = 50;  // a driver that has just been opened fetches what the device has
constexpr uint32_t kPatienceMs = 200;
constexpr std::array<int32_t, 2> kLiveness = {80, 500};  // a busy machine may keep a healthy handset's answer
constexpr uint64_t kMostReplies = 16;                    // that a loader may have for these questions

bool SaysHello(Diag_FTM& phone) {
  kivrat::RawPort port(phone);
  if (!port.Open()) return false;
  port.SetReadTimeOut(kHelloWaitMs);
  std::array<uint8_t, kivrat::kHelloSize> packet{};
  const size_t count = port.Read(packet);
  return kivrat::IsPacket(std::span(packet).first(count), kivrat::kHello);
}

// Without the loopback that may go in front of requests: neither of these two knows it.
bool Answers(Diag_FTM& phone, uint8_t request, uint8_t reply) {
  std::array<uint8_t, 64> room{};
  return static_cast<bool>(phone.SendSync({&request, 1}, room, reply, kPatienceMs));
}

// Whoever sends many packets meanwhile is there as well: answers stand behind logs and events then, and come late.
bool IsInDiagnostics(Diag_FTM& phone) {
  const uint64_t packets = phone.counters().packets_received;
  const auto before = static_cast<int32_t>(phone.TimeOut(kTimeOutLiveness));
  const AtExit restore([&] { phone.ConfigureTimeOut(kTimeOutLiveness, before); });
  const bool answers = std::ranges::any_of(kLiveness, [&](int32_t milliseconds) {
    phone.ConfigureTimeOut(kTimeOutLiveness, std::max(before, milliseconds));
    return phone.IsPhoneConnected();
  });
  return answers || (phone.IsPortOpen() && phone.counters().packets_received - packets > kMostReplies);
}

}  // namespace

uint32_t AskPort(Diag_FTM& phone) {
  if (phone.server_mode() || phone.port_borrowed()) return KRAL_ANSWERS_NOT_ASKED;
  const KeepFailure keep;  // silence is an answer
  if (!phone.connected() && SaysHello(phone)) return KRAL_ANSWERS_BOOT_LOADER;
  if (!phone.IsPortOpen()) return KRAL_ANSWERS_NOT_ASKED;
  if (IsInDiagnostics(phone)) return KRAL_ANSWERS_DIAGNOSTICS;
  if (!phone.IsPortOpen()) return KRAL_ANSWERS_NOT_ASKED;  // gone in the meantime
  if (Answers(phone, stream::kNop, stream::kNopReply)) return KRAL_ANSWERS_FLASH_PROGRAMMER;
  if (Answers(phone, kova::kNop, kova::kAcknowledge)) return KRAL_ANSWERS_LOADER;
  return KRAL_ANSWERS_NOTHING;
}

}  // namespace kral
