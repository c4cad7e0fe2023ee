// Operating modes by the names that people use.
#ifndef KRAL_TOOLS_PHONE_OPERATING_MODE_H
#define KRAL_TOOLS_PHONE_OPERATING_MODE_H

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tools/kral/session.h"

namespace kral::tool {

struct ModeRequest {
  std::string_view name;
  std::uint16_t mode;
};
inline constexpr std::array<ModeRequest, 5> kModeRequests{{{"ftm", KRAL_MODE_FACTORY_TEST},
                                                           {"online", KRAL_MODE_ONLINE},
                                                           {"offline", KRAL_MODE_OFFLINE_DIGITAL},
                                                           {"lpm", KRAL_MODE_LOW_POWER},
                                                           {"reset", KRAL_MODE_RESET}}};

// The state that the handset reports; fails with 0 when it does not say.
std::uint8_t ReadOperatingState(const Session& session, std::uint32_t& state);
std::string_view NameOfState(std::uint32_t state);

}  // namespace kral::tool

#endif
