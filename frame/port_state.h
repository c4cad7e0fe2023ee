// What stands between a phone object and its port.
#ifndef KRAL_FRAME_PORT_STATE_H
#define KRAL_FRAME_PORT_STATE_H

#include <cstdint>

namespace kral {

class Diag_FTM;

// One of the KRAL_PORT_ states of <kral/connection.h>. With the request lock held.
int32_t PortState(Diag_FTM& phone);

}  // namespace kral

#endif
