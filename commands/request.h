// Requests as typed rows: a row names the fields behind its header, and Send appends exactly those, little-endian. A
// missing, surplus or too wide field does not compile.
//
//   inline constexpr DiagRequest<u16> kSetSwitches{48};
//   Send(phone, kSetSwitches, switches);           // 30 lo hi
//
// What stands in front of the fields, and how the packet goes out, is the row's header type. A header has
//   key()                         by which a table of rows is sorted
//   Begin(phone)                  resets the default packet buffer and writes the header into it
//   Transmit(phone, time_out_ms)  sends what the buffer holds and awaits the reply
#ifndef KRAL_COMMANDS_REQUEST_H
#define KRAL_COMMANDS_REQUEST_H

#include <algorithm>
#include <array>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <span>
#include <type_traits>
#include <utility>

#include "base/diag_packet.h"
#include "base/wire_codes.h"
#include "frame/diag_ftm.h"

namespace kral {

using u8 = std::uint8_t;
using u16 = std::uint16_t;
using u32 = std::uint32_t;
using s8 = std::int8_t;
using s16 = std::int16_t;
using s32 = std::int32_t;

// Field types beside the integers: N bytes exactly, or a run of bytes, words or double words of any length.
template <std::size_t N>
using Block = std::span<const u8, N>;
using Bytes = std::span<const u8>;
using Words = std::span<const u16>;
using DoubleWords = std::span<const u32>;

template <class T>
concept WireInteger = std::integral<T> && !std::same_as<T, bool>;

template <class Source, class T>
concept BraceConvertible = requires {
  T{std::declval<Source>()};
};

// Integers convert only where every value of the source fits (u8 to u16, never back).
template <class Source, class T>
constexpr bool FitsField() {
  if constexpr (WireInteger<T> && WireInteger<Source>) return BraceConvertible<Source, T>;
  return !WireInteger<T> && std::convertible_to<const Source&, T>;
}

template <class Source, class T>
concept FieldSource = FitsField<Source, T>();

// The value of one field.
template <class T>
struct Field {
  T value;

  template <FieldSource<T> Source>
  constexpr Field(const Source& source) : value(source) {}
};

template <class T>
void AppendField(CDiagPacket& packet, const Field<T>& field) {
  if constexpr (WireInteger<T>) {
    const auto bits = static_cast<std::make_unsigned_t<T>>(field.value);
    if constexpr (sizeof(T) == 1) {
      packet.Append8(bits);
    } else if constexpr (sizeof(T) == 2) {
      packet.Append16(bits);
    } else {
      static_assert(sizeof(T) == 4, "no request carries wider fields");
      packet.Append32(bits);
    }
  } else if constexpr (sizeof(typename T::value_type) == 1) {
    packet.AppendBlock(field.value);
  } else {
    for (const auto element : field.value) AppendField(packet, Field<typename T::value_type>(element));
  }
}

template <class Header, class... Fields>
struct Request {
  Header header;
};

// Builds the request in the phone's default packet buffer without sending it.
template <class Header, class... Fields>
void Compose(Diag_FTM& phone, const Request<Header, Fields...>& row, std::type_identity_t<Field<Fields>>... fields) {
  row.header.Begin(phone);
  (AppendField(phone.packet(), fields), ...);
}

// The reply is the response of the phone's default packet buffer, too. What went wrong has been noted (base/failure.h).
template <class Header, class... Fields>
Reply Send(Diag_FTM& phone, const Request<Header, Fields...>& row, std::type_identity_t<Field<Fields>>... fields) {
  Compose(phone, row, fields...);
  return row.header.Transmit(phone, phone.TimeOut(kTimeOutDefaultCommand));
}

// The same with another time-out than the default one.
template <class Header, class... Fields>
Reply SendWithin(Diag_FTM& phone, u32 time_out_id, const Request<Header, Fields...>& row,
                 std::type_identity_t<Field<Fields>>... fields) {
  Compose(phone, row, fields...);
  return row.header.Transmit(phone, phone.TimeOut(time_out_id));
}

// A reply that repeats the beginning of its request tells itself from one to an earlier request with the same first
// byte, which comes after that was given up. One of fewer than `least` bytes repeats nothing, and is judged by whoever
// asked. Replies to writes repeat their data as well, `with_data` bytes in all, but that is not asked of a handset as
// long as no answer of its can be late.
inline Reply SendEchoed(Diag_FTM& phone, u32 time_out_ms, std::size_t echoed, std::size_t least,
                        std::size_t with_data = 0) {
  const auto request = phone.packet().request();
  const auto head = request.first(std::min(echoed, request.size()));
  const auto all = request.first(phone.MayGetLateAnswer() ? std::min(with_data, request.size()) : 0);
  return phone.Send(phone.packet(), time_out_ms, 0, [head, all, least](std::span<const u8> reply) {
    if (reply.size() < least) return true;
    const auto repeated = reply.size() < all.size() || all.size() < head.size() ? head : all;
    return std::equal(repeated.begin(), repeated.end(), reply.begin());
  });
}

// For the static_assert behind a table of rows.
template <class... Rows>
constexpr bool AreSorted(const Rows&... rows) {
  const std::array<u32, sizeof...(Rows)> keys{rows.header.key()...};
  return std::ranges::is_sorted(keys);
}

// --- The two plain headers ------------------------------------------------------------------------------------------

// One byte, the command code. The reply repeats so many bytes of the request, and has something behind them: some
// handsets answer with the code and a status alone.
struct DiagHeader {
  u8 code;
  u8 echoed = 1;
  u16 with_data = 0;

  constexpr u32 key() const { return code; }
  void Begin(Diag_FTM& phone) const {
    phone.packet().Reset();
    phone.packet().Append8(code);
  }
  Reply Transmit(Diag_FTM& phone, u32 time_out_ms) const {
    return SendEchoed(phone, time_out_ms, echoed, echoed + 1U, with_data);
  }
};

// The subsystem-dispatch form: 75, the subsystem, its 16-bit command.
struct SubsystemHeader {
  u8 subsystem;
  u16 command;
  u8 echoed = 4;
  u16 with_data = 0;

  constexpr u32 key() const { return u32{subsystem} << 16 | command; }
  void Begin(Diag_FTM& phone) const {
    phone.packet().Reset();
    phone.packet().Append8(kSubsystemDispatch);
    phone.packet().Append8(subsystem);
    phone.packet().Append16(command);
  }
  Reply Transmit(Diag_FTM& phone, u32 time_out_ms) const {
    return SendEchoed(phone, time_out_ms, echoed, echoed, with_data);
  }
};

template <class... Fields>
using DiagRequest = Request<DiagHeader, Fields...>;
template <class... Fields>
using SubsystemRequest = Request<SubsystemHeader, Fields...>;

}  // namespace kral

#endif
