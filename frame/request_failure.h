// What callers are told of a request without the reply that it asked for.
#ifndef KRAL_FRAME_REQUEST_FAILURE_H
#define KRAL_FRAME_REQUEST_FAILURE_H

#include <cstdint>
#include <span>

#include "base/failure.h"
#include "transport/engine/reply.h"

namespace kral {

class Diag_FTM;

// Of a reply that is not the expected one.
Failure RequestFailure(Diag_FTM& phone, const Reply& reply, std::span<const uint8_t> request, uint32_t time_out_ms);

// Why the port of the phone object is not open; with the request lock held.
Failure PortFailure(Diag_FTM& phone);

// The expected reply came, and its content cannot be what was asked for: too short, or its fields contradict.
Failure BadReply(Diag_FTM& phone, const char* what);

// The log text of an error response; null for another code.
const char* RefusalText(uint8_t code);

}  // namespace kral

#endif
