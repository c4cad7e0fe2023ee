// Who a handset says it is, as far as it does.
#ifndef KRAL_TOOLS_HANDSET_IDENTITY_H
#define KRAL_TOOLS_HANDSET_IDENTITY_H

#include <string>

#include "tools/kral/session.h"

namespace kral::tool {

std::string SerialOf(Session& session);  // "80C0FFEE"
std::string ModelOf(Session& session);

// The answer to one of these; empty where the handset refuses it.
std::string IfTold(Session& session, std::string (*question)(Session& session));

}  // namespace kral::tool

#endif
