// Asks for serial number and model.
#include "tools/kral/handset_identity.h"

#include <vector>

#include "tools/kral/format.h"
#include "tools/kral/output.h"

namespace kral::tool {

std::string SerialOf(Session& session) {
  std::uint32_t serial = 0;
  session.Run("the serial-number request", [&] { return KRAL_DIAG_READ_ESN_F(session.handle(), &serial); });
  return Format("{:08X}", serial);
}

std::string ModelOf(Session& session) {
  std::uint32_t hardware = 0, number = 0;
  std::vector<char> revision(KRAL_BUILD_ID_TEXT_SIZE), model(KRAL_BUILD_ID_TEXT_SIZE);
  session.Run("the build-identity request", [&] {
    return KRAL_DIAG_EXT_BUILD_ID_F(session.handle(), &hardware, &number, revision.data(), model.data());
  });
  return Printable(model.data());
}

std::string IfTold(Session& session, std::string (*question)(Session& session)) {
  try {
    return question(session);
  } catch (const ToolError& error) {
    if (error.code() != ExitCode::kRefused) throw;
    return {};
  }
}

}  // namespace kral::tool
