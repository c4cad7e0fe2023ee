// Export of what is known of a port. It stands here and not with the other port functions because those who answer on a
// port include the loaders.
#include <algorithm>
#include <chrono>
#include <mutex>
#include <span>
#include <string>
#include <thread>

#include "base/at_exit.h"
#include "download/port_question.h"
#include "frame/export_call.h"
#include "frame/phone_claim.h"
#include "frame/port_state.h"
#include "kral/connection.h"
#include "platform/port_info.h"

namespace {

// Longer than a request takes, and not felt.
constexpr std::chrono::milliseconds kBusyWait{300};
constexpr std::chrono::milliseconds kLookAgain{5};

using kral::Fail;
using kral::Failure;
using kral::PortObstacle;
namespace table = kral::Kral_ResourceManager;

// What does not fit is left out at the end, and never a part of a character.
void Copy(const std::string& text, std::span<char> room) {
  size_t size = std::min(text.size(), room.size() - 1);
  if (size < text.size()) {
    while (size > 0 && (static_cast<unsigned char>(text[size]) & 0xC0) == 0x80) --size;
  }
  std::ranges::fill(room, '\0');
  std::copy_n(text.begin(), size, room.begin());
}

uint32_t StateOf(const kral::PortInfo& port) {
  switch (port.obstacle) {
    case PortObstacle::kNone:
      return KRAL_PORT_CLOSED;
    case PortObstacle::kNotFound:
      return KRAL_PORT_NOT_FOUND;
    case PortObstacle::kNotPermitted:
      return KRAL_PORT_NOT_PERMITTED;
    case PortObstacle::kInUseHere:
      return KRAL_PORT_OPEN;
    default:
      return KRAL_PORT_BUSY;
  }
}

// At once where a job works on the handset, between its steps as well: what is asked there is no part of them. False
// also when something else keeps the connection busy.
bool LockToAsk(kral::Diag_FTM& phone, std::unique_lock<std::recursive_mutex>& lock) {
  const auto end = std::chrono::steady_clock::now() + kBusyWait;
  const auto& job = phone.state<kral::PhoneClaim>().job;
  while (job == 0 && !lock.try_lock()) {
    if (std::chrono::steady_clock::now() >= end) return false;
    std::this_thread::sleep_for(kLookAgain);
  }
  return job == 0;
}

// In a context of its own, or in that of whoever is connected to the port.
bool Ask(uint16_t port, KRAL_PORT_INFO& info) {
  const KRAL_HANDLE handle = table::CreateContext(port);
  if (handle == 0) return false;
  const kral::AtExit asked([handle] { table::ReleaseContext(handle, false); });
  const auto phone = table::GetPhone(handle);
  if (!phone) return Fail(Failure(KRAL_ERROR_NO_PORT, "there is no phone server"));
  std::unique_lock lock(phone->request_lock(), std::defer_lock);
  if (!LockToAsk(*phone, lock)) {
    info.state = KRAL_PORT_OPEN;
    return true;
  }
  const bool was_open = phone->connected() || phone->port_borrowed();
  info.answers = kral::AskPort(*phone);
  const auto state = static_cast<uint32_t>(kral::PortState(*phone));
  // Busy, and with this process: its device has another number besides, and is open under that.
  if (state == KRAL_PORT_BUSY && info.state == KRAL_PORT_OPEN) return true;
  info.state = state == KRAL_PORT_OPEN && !was_open ? KRAL_PORT_CLOSED : state;
  return true;
}

bool GetPortInfo(uint16_t port, bool ask, KRAL_PORT_INFO& output) {
  if (table::server_mode()) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "of the ports of a phone server nothing is known here"));
  }
  if (port >= KRAL_PORT_NULL) return Fail(Failure(KRAL_ERROR_ARGUMENT, "%u is no COM port", unsigned{port}));
  const kral::PortInfo found = kral::DescribeComPort(port);
  KRAL_PORT_INFO info{};
  info.state = StateOf(found);
  info.process = found.process;
  info.vendor = found.vendor;
  info.product = found.product;
  info.usb_interface = found.usb_interface;
  Copy(found.device, info.device);
  Copy(found.description, info.description);
  Copy(found.usb_path, info.usb_path);
  Copy(found.serial, info.serial);
  Copy(found.process_name, info.process_name);
  // To ask on a port that another program has would only disturb the two.
  const bool is_free = info.state != KRAL_PORT_BUSY && info.state != KRAL_PORT_NOT_PERMITTED;
  if (ask && is_free && !Ask(port, info)) return false;
  output = info;
  return true;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_GetPortInfo(uint16_t port, uint8_t ask, KRAL_PORT_INFO* info) {
  return kral::ExportCall(__func__)
      .Require(info != nullptr, "there is no room for the record")
      .Alone(uint8_t{0}, uint8_t{1}, [=]() -> uint8_t { return GetPortInfo(port, ask == 1, *info) ? 1 : 0; });
}

}  // extern "C"
