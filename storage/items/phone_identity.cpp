// Asks the handset who it is.
#include "storage/items/phone_identity.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <functional>
#include <string>

#include "base/failure.h"
#include "commands/core/core_diag.h"
#include "storage/items/phone_items.h"

namespace kral::items {
namespace {

// What gets lost on the way is asked for again: a backup would not say whose it is. A refusal stays one.
bool IsTold(const std::function<bool()>& ask) {
  for (int i = 0; i < kTries; ++i) {
    if (ask()) return true;
    const uint32_t code = NotedFailure();
    if (code != KRAL_ERROR_NO_ANSWER && code != KRAL_ERROR_LINK) break;
  }
  return false;
}

// A text of the handset as the value of a property: it must not end its line.
std::string PropertyText(const char* text) {
  std::string value = text;
  std::replace_if(
      value.begin(), value.end(), [](char c) { return static_cast<unsigned char>(c) < ' '; }, ' ');
  value.erase(value.find_last_not_of(' ') + 1);
  return value;
}

}  // namespace

void AppendIdentity(Diag_FTM& phone, pkv::PkvProperties& properties) {
  const Diag_FTM::Resynchronising resynchronising(phone);  // these replies repeat nothing
  uint32_t serial = 0;
  if (IsTold([&] { return diag::ReadSerialNumber(phone, &serial); })) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%08X", static_cast<unsigned>(serial));
    properties.values.emplace_back("ESN", text.data());
  }
  if (NotedFailure() == KRAL_ERROR_ABORTED) return;
  std::array<std::array<char, CDiagPacket::kCapacity>, 2> texts{};
  uint32_t hardware = 0;
  uint32_t model = 0;
  if (IsTold([&] { return diag::ReadExtendedBuildId(phone, &hardware, &model, texts[0].data(), texts[1].data()); })) {
    properties.values.emplace_back("HardwareVersion", std::to_string(hardware));
    properties.values.emplace_back("MobileModel", std::to_string(model));
    properties.values.emplace_back("SoftwareRevision", PropertyText(texts[0].data()));
    properties.values.emplace_back("Model", PropertyText(texts[1].data()));
  }
}

}  // namespace kral::items
