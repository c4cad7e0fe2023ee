// Who answers on a port: the software of a handset, or one of those that take part in a download.
#ifndef KRAL_DOWNLOAD_PORT_QUESTION_H
#define KRAL_DOWNLOAD_PORT_QUESTION_H

#include "frame/diag_ftm.h"

namespace kral {

// One of the KRAL_ANSWERS_ of <kral/connection.h>, with the request lock held. Opens the port of a connection that is
// closed, and leaves that to whoever made the connection.
uint32_t AskPort(Diag_FTM& phone);

}  // namespace kral

#endif
