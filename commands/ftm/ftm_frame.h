// The frame of every FTM command: the packet header under both command codes, and how a request goes out.
//
//   code 75:  75  subsystem  mode id (16)  command id (16)  [request length (16)  response length (16)]  payload
//   code 59:  59  0x0077 (16)  length (8)  0  command id (16)  [the same]  payload
#ifndef KRAL_COMMANDS_FTM_FTM_FRAME_H
#define KRAL_COMMANDS_FTM_FTM_FRAME_H

#include <cstddef>
#include <cstdint>
#include <span>

#include "commands/ftm_settings.h"
#include "commands/request.h"

namespace kral {

class Diag_FTM;

namespace ftm {

inline constexpr u32 kCommandCode75 = 75;
inline constexpr u32 kCommandCode59 = 59;

enum class HeaderForm : u8 {
  kPlain = 0,     // the payload follows the command id
  kExtended = 1,  // request and response data lengths follow the command id
  kPmic = 2,      // two 16-bit zeros follow the command id, and the first payload byte is the argument
};
inline constexpr u8 kHeaderFormCount = 3;

// Bytes up to and including the command id.
size_t HeaderSize(Diag_FTM& phone);

// Resets the default packet buffer and writes the header up to the command id, with the current mode id.
void BeginHeader(Diag_FTM& phone);
void BeginHeader(Diag_FTM& phone, u16 mode_id);

// Header and command id, and what the form puts behind it.
void BeginCommand(Diag_FTM& phone, u16 mode_id, HeaderForm form, u16 command);

// The request data length that the dispatcher of a mode id expects in the extended header; 0 where none is known.
u16 RequestDataLength(u16 mode_id, u16 command);

// Sends what the default packet buffer holds; under code 75 by way of the queue or the sequencer when they are on. A
// request that the queue took counts as answered, with nothing.
Reply Transmit(Diag_FTM& phone);

// Rows of commands with arguments of their own: FtmRequest<u16> kSetChannel{8}. Current mode id, plain header.
struct FtmHeader {
  u16 command;

  constexpr u32 key() const { return command; }
  void Begin(Diag_FTM& phone) const;
  Reply Transmit(Diag_FTM& phone, u32 time_out_ms) const;
};

template <class... Fields>
using FtmRequest = Request<FtmHeader, Fields...>;

inline constexpr FtmRequest<> kSetTxOn{2};
inline constexpr FtmRequest<> kSetTxOff{3};
inline constexpr FtmRequest<u16> kSetMode{7};
inline constexpr FtmRequest<u16> kSetChannel{8};
static_assert(AreSorted(kSetTxOn, kSetTxOff, kSetMode, kSetChannel));

}  // namespace ftm
}  // namespace kral

#endif
