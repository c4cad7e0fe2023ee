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
  std::uint16_t mode;  // as mode control takes it
};
inline constexpr std::array<ModeRequest, 5> kModeRequests{
    {{"ftm", 3}, {"online", 4}, {"offline", 1}, {"lpm", 5}, {"reset", 2}}};

// The state that the handset reports; fails with 0 when it does not say.
std::uint8_t ReadOperatingState(const Session& session, std::uint32_t& state);
std::string_view NameOfState(std::uint32_t state);

}  // namespace kral::tool

#endif
